#include "cli/commands.h"
#include "cli/output.h"
#include "cli/project.h"
#include "cli/usererror.h"

#include "frame/services/reports.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/projectfile.h"
#include "host/session.h"
#include "host/storeerror.h"

#include <CLI/CLI.hpp>

#include <cstdio>
#include <new>
#include <string>

namespace {

constexpr int FailureCode = 2;

// What the library reported first: it explains an error code.
std::string firstReport;

void RememberFirstReport(Q_Report const& report)
{
    if (firstReport.empty() && report.text) firstReport = report.text;
}

void AddSelection(CLI::App& command, Selection& selection)
{
    command.add_option("FILE", selection.file, "a project, or a .gltf, .glb or .bvh file")->required();
    command
        .add_option("--stream", selection.glob, "only streams whose path matches this pattern, with * and ? (quote it)")
        ->type_name("GLOB")
        ->capture_default_str();
    command
        .add_option("--time-scale", selection.timeScale,
                    "hold times in this many units a second (default: chosen so that key times are exact)")
        ->check(TimeScaleCheck())
        ->type_name("N");
    command
        .add_option_function<std::string>(
            "--as", [&selection](std::string const& name) { selection.asPaths = name == "spatial"; },
            "spatial: hold positions as paths, with one speed graph each (default: plain)")
        ->check(CLI::IsMember({"plain", "spatial"}))
        ->type_name("FORM");
    command.add_flag("--rove", selection.roving,
                     "with --as spatial: let all keys but the first and the last float, which smooths the speed");
}

void AddInfo(CLI::App& app, InfoOptions& options)
{
    CLI::App* const command = app.add_subcommand("info", "List what is animated: streams, keys, span, interpolation");
    AddSelection(*command, options.selection);
    command->callback([&options] { RunInfo(options); });
}

Format FormatNamed(std::string const& name)
{
    return name == "csv" ? Format::Csv : name == "json" ? Format::Json : Format::Table;
}

void AddEval(CLI::App& app, EvalOptions& options)
{
    CLI::App* const command = app.add_subcommand("eval", "Print values at regular times");
    AddSelection(*command, options.selection);
    command
        ->add_option("--from", options.from,
                     "first time: seconds like 0.5 or 1/24, or frames like 12f (default: first key)")
        ->type_name("TIME");
    command->add_option("--to", options.to, "last time (default: last key)")->type_name("TIME");
    command->add_option("--fps", options.fps, "samples a second, like 24 or 30000/1001")
        ->type_name("RATE")
        ->capture_default_str();
    command
        ->add_option_function<std::string>(
            "--format", [&options](std::string const& name) { options.format = FormatNamed(name); },
            "how to print (default: table)")
        ->check(CLI::IsMember({"table", "csv", "json"}))
        ->type_name("FORMAT");
    command->footer(
        "Numbers are printed with as many digits as it takes to read the same number back. JSON gives times as\n"
        "[numerator, denominator] in seconds, which is exact; tables print them as fractions or decimals.");
    command->callback([&options] { RunEval(options); });
}

void RunEitherPlot(PlotOptions& options, bool formGiven)
{
    RefuseToOverwrite(options.selection.file, options.output);
    if (!options.motion) {
        RunPlot(options);
        return;
    }
    if (formGiven && !options.selection.asPaths)
        throw UserError("--motion", "draws paths, so it can't go with --as plain");
    options.selection.asPaths = true;
    RunMotionPlot(options);
}

void AddPlot(CLI::App& app, PlotOptions& options)
{
    CLI::App* const command =
        app.add_subcommand("plot", "Draw value and speed graphs, or motion paths, into an SVG file");
    AddSelection(*command, options.selection);
    command->add_option("-o,--output", options.output, "the drawing; - for the standard output")
        ->required()
        ->type_name("SVG");
    command->add_flag(
        "--motion", options.motion,
        "draw positions as routes in space, with their keys, tangents and a dot a frame, over their speed");
    command->add_flag("--frames", options.inFrames, "label the time axis in frames");
    command->add_option("--fps", options.fps, "frames a second for --frames and --motion")
        ->type_name("RATE")
        ->capture_default_str();
    command->callback([&options, command] { RunEitherPlot(options, command->count("--as") > 0); });
}

// A project is known by how it begins, whatever its name is.
kfshost::Scene ReadScene(Selection const& selection)
{
    if (!kfshost::IsProjectFile(selection.file)) return kfshost::ImportFile(selection.file, {selection.timeScale});
    if (selection.timeScale != 0) throw UserError("--time-scale", "a project has the times with which it was imported");
    return kfshost::TakeScene(kfshost::LoadProject(selection.file));
}

int Fail(std::string const& message)
{
    std::fprintf(stderr, "kfs: %s\n", message.c_str());
    return FailureCode;
}

// One line as for any other error, with a hint. What stands where a command should is told by its name.
std::string TellUsageError(CLI::App const* app, CLI::Error const& error)
{
    std::vector<std::string> const rest = app->remaining();
    bool const lacksCommand = error.get_name() == "RequiredError" && app->get_subcommands().empty();
    std::string const what =
        lacksCommand && !rest.empty() ? "there is no command \"" + rest.front() + '"' : error.what();
    return "kfs: " + what + " (kfs --help tells what there is)\n";
}

// Runs what the words ask for. Help ends with 0.
int Parse(CLI::App& app, int argc, char** argv)
{
    app.failure_message(TellUsageError);
    try {
        app.parse(argc, argv);
    } catch (CLI::RuntimeError const& answer) {  // how a command answers with a code of its own
        return answer.get_exit_code();
    } catch (CLI::ParseError const& error) {
        return app.exit(error) == 0 ? 0 : FailureCode;
    }
    return 0;
}

}  // namespace

kfshost::Scene LoadScene(Selection const& selection)
{
    if (selection.roving && !selection.asPaths)
        throw UserError("--rove", "only paths have keys that can float: add --as spatial");
    try {
        kfshost::Scene scene = ReadScene(selection);
        if (selection.asPaths) HoldAsPaths(scene, selection);
        return scene;
    } catch (kfshost::ImportError const& error) {
        throw UserError(selection.file, error.what());
    }
}

int main(int argc, char** argv)
try {
    kfshost::Session const session;
    Q_SetReportSink(RememberFirstReport);

    CLI::App app{
        "Takes the animation out of a file, holds it in streams of keys, and answers with values and drawings.", "kfs"};
    app.require_subcommand(1);
    app.set_version_flag("--version", KFS_VERSION_TEXT);
    app.footer("Examples:\n"
               "  kfs info walk.glb\n"
               "  kfs eval walk.glb --stream '*/Hips/*' --fps 30 --format csv\n"
               "  kfs plot walk.glb --stream '*/Hips/translation' -o hips.svg\n"
               "  kfs plot walk.glb --motion --stream '*/Hips/translation' -o path.svg\n"
               "  kfs import walk.glb -o walk.kfs\n"
               "\n"
               "What is wrong with a file is one line on the standard error and exit code 2; nothing is written then.\n"
               "A command line that isn't understood has exit code 2 too.");
    InfoOptions info;
    EvalOptions eval;
    PlotOptions plot;
    ProjectOptions project;
    AddInfo(app, info);
    AddEval(app, eval);
    AddPlot(app, plot);
    AddProjectCommands(app, project);
    return Parse(app, argc, argv);
} catch (kfshost::StoreError const& error) {
    return Fail(firstReport.empty() ? error.what() : error.what() + (": " + firstReport));
} catch (std::bad_alloc const&) {
    return Fail("out of memory");
} catch (std::exception const& error) {
    return Fail(error.what());
}
