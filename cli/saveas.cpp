#include "cli/command.h"
#include "cli/errors.h"
#include "cli/options.h"
#include "cli/projectoutput.h"

namespace {

struct Options {
    std::string file;
    std::string output;
    bool repair = false;
};

// What had to be changed for a load is lost in what is saved, so nobody does that unawares.
std::unique_ptr<kfshost::SceneGroup> Load(Options const& options)
{
    kfshost::FileInput const input = kfshost::ReadInput(options.file);
    if (input.kind != kfshost::FileKind::Project) throw kfshost::ImportError("", "isn't a project");
    kfshost::LoadNotes notes;
    auto tree = kfshost::LoadProject(input, &notes);
    if (!notes.reports.empty() && !options.repair)
        throw kfshost::ImportError("", notes.reports.front() + " (--repair saves what is left)");
    for (std::string const& report : notes.reports) TellAbout(options.file, report);
    return tree;
}

// Through the tree and nothing else, so that what a file has comes out as this version writes it.
int Run(Options const& options)
{
    WriteProject(*ReadingFile(options.file, [&] { return Load(options); }), options.output, "saved");
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    command.add_option("FILE", options->file, "a project file")->required();
    AddOutput(command, options->output, "the new project file", "PROJECT");
    command.add_flag("--repair", options->repair,
                     "also save what had to be changed to be loaded: what was cut is lost then");
    return [options] { return Run(*options); };
}

}  // namespace

Command const SaveAsCommand{"Make and check projects", "save-as", "Load a project and save it as another file",
                            Prepare};
