#include "cli/project.h"

#include "cli/commands.h"
#include "cli/diff.h"
#include "cli/output.h"
#include "cli/usererror.h"
#include "host/chunkdump.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/projectfile.h"

#include <fmt/format.h>

#include <charconv>
#include <climits>

namespace {

// What a command answers that looked at its files and found something.
constexpr int FoundCode = 1;

void RunImport(ProjectOptions const& options)
{
    if (options.output == "-") throw UserError("-o", "a project goes into a file, not to the standard output");
    RefuseToOverwrite(options.file, options.output);
    try {
        kfshost::Scene scene = kfshost::ImportFile(options.file, {options.timeScale});
        std::size_t keys = 0;
        for (kfshost::StreamItem const& item : scene.streams)
            keys += static_cast<std::size_t>(kfshost::KeyCount(*item.stream));
        std::string const summary =
            fmt::format("{}: {}, {}\n", options.output, Plural(scene.streams.size(), "stream", "streams"),
                        Plural(keys, "key", "keys"));
        kfshost::SaveProject(*kfshost::MakeTree(std::move(scene)), options.output);
        WriteToStandardOutput(summary);
    } catch (kfshost::ImportError const& error) {
        throw UserError(options.file, error.what());
    }
}

// Through the tree and nothing else, so that what a file has comes out as this version writes it.
void RunSaveAs(ProjectOptions const& options)
{
    try {
        kfshost::SaveProject(*kfshost::LoadProject(options.file), options.output);
        WriteToStandardOutput(fmt::format("{}: saved\n", options.output));
    } catch (kfshost::ImportError const& error) {
        throw UserError(options.file, error.what());
    }
}

// Shows what it can, and then tells by the exit code whether all of it was sound.
void RunDump(ProjectOptions const& options)
{
    try {
        kfshost::ChunkDump const dump = kfshost::DumpChunks(options.file);
        WriteToStandardOutput(dump.text);
        if (dump.problems > 0) throw CLI::RuntimeError(FoundCode);
    } catch (kfshost::ImportError const& error) {
        throw UserError(options.file, error.what());
    }
}

void RunDiff(ProjectOptions const& options)
{
    Selection before;
    before.file = options.file;
    Selection after;
    after.file = options.other;
    std::string const text = DifferencesOf(LoadScene(before), LoadScene(after));
    WriteToStandardOutput(text);
    if (!text.empty()) throw CLI::RuntimeError(FoundCode);
}

}  // namespace

CLI::Validator TimeScaleCheck()
{
    return CLI::Validator(
        [](std::string const& text) -> std::string {
            unsigned int scale = 0;
            auto const [end, error] = std::from_chars(text.data(), text.data() + text.size(), scale);
            bool const isScale = error == std::errc() && end == text.data() + text.size() && scale > 0;
            return isScale ? "" : fmt::format("{} isn't a whole number from 1 to {}", text, UINT_MAX);
        },
        "");
}

void AddProjectCommands(CLI::App& app, ProjectOptions& options)
{
    CLI::App* const importer = app.add_subcommand("import", "Save the animation of a file as a project");
    importer->add_option("FILE", options.file, "a .gltf, .glb or .bvh file")->required();
    importer->add_option("-o,--output", options.output, "the project file")->required()->type_name("PROJECT");
    importer
        ->add_option("--time-scale", options.timeScale,
                     "hold times in this many units a second (default: chosen so that key times are exact)")
        ->check(TimeScaleCheck())
        ->type_name("N");
    importer->callback([&options] { RunImport(options); });

    CLI::App* const saveAs = app.add_subcommand("save-as", "Load a project and save it as another file");
    saveAs->add_option("FILE", options.file, "a project file")->required();
    saveAs->add_option("-o,--output", options.output, "the new project file")->required()->type_name("PROJECT");
    saveAs->callback([&options] { RunSaveAs(options); });

    CLI::App* const dump = app.add_subcommand("dump", "Show the chunks of a project file, broken ones too");
    dump->add_option("FILE", options.file, "a project file")->required();
    dump->footer("Each line has the offset of a chunk, its id, its length in brackets, and what stands in it.\n"
                 "The exit code is 1 if anything is wrong with a chunk; its line says what.");
    dump->callback([&options] { RunDump(options); });

    CLI::App* const diff = app.add_subcommand("diff", "Tell how the streams of two files differ");
    diff->add_option("BEFORE", options.file, "a project, or a .gltf, .glb or .bvh file")->required();
    diff->add_option("AFTER", options.other, "another one")->required();
    diff->footer(
        "A line for each stream that differs: - only in BEFORE, + only in AFTER, ~ in both, with what differs first.\n"
        "Keys show their values and, like (2/1), how the curve comes in and goes out: 1 linear, 2 spline, 3 hold.\n"
        "The exit code is 0 if nothing differs and 1 if something does.");
    diff->callback([&options] { RunDiff(options); });
}
