#include "cli/command.h"
#include "cli/errors.h"
#include "cli/expressions.h"
#include "cli/output.h"
#include "cli/signals.h"
#include "host/session.h"

#include <string>
#include <vector>

namespace {

constexpr Command const* Commands[] = {&InfoCommand, &EvalCommand,   &DiffCommand, &IdentityCommand, &SampleCommand,
                                       &PlotCommand, &ImportCommand, &DragCommand, &SaveAsCommand,   &SeparateCommand,
                                       &JoinCommand, &SetCommand,    &DumpCommand};

// One line as for any other error, with a hint. What stands where a command should is told by its name.
std::string TellUsageError(CLI::App const* app, CLI::Error const& error)
{
    std::vector<std::string> const rest = app->remaining();
    bool const lacksCommand = error.get_name() == "RequiredError" && app->get_subcommands().empty();
    std::string const what =
        lacksCommand && !rest.empty() ? "there is no command \"" + rest.front() + '"' : error.what();
    return "kfs: " + Shown(what) + " (kfs --help tells what there is)\n";
}

int Run(int argc, char** argv)
{
    CLI::App app{
        "Takes the animation out of a file, holds it in streams of keys, and answers with values and drawings.", "kfs"};
    app.require_subcommand(1);
    app.set_version_flag("--version", KFS_VERSION_TEXT);
    app.failure_message(TellUsageError);
    std::vector<std::pair<CLI::App const*, Work>> works;
    for (Command const* command : Commands) {
        CLI::App* const words = app.add_subcommand(command->name, command->summary)->group(command->task);
        works.emplace_back(words, command->prepare(*words));
    }
    // After the commands were made, so that they don't take it over.
    app.footer(
        "Examples:\n"
        "  kfs info walk.glb\n"
        "  kfs eval walk.glb --stream '*/Hips/*' --fps 30 --format csv\n"
        "  kfs plot walk.glb --stream '*/Hips/translation' -o hips.svg\n"
        "  kfs plot walk.glb --motion --stream '*/Hips/translation' -o path.svg\n"
        "  kfs import walk.glb -o walk.kfs\n"
        "  kfs drag walk.kfs --stream '*/Hips/translation' --component y --at 12f --to 90 -o higher.kfs\n"
        "\n"
        "Exit codes: 0 done; 1 diff, dump or identity found something, or a project had to be changed so that it\n"
        "could be loaded, which lines on the standard error tell; 2 failed. What failed, a command line\n"
        "that isn't understood included, is one line on the standard error, and nothing is written then; but\n"
        "where only expressions of streams have failed, a line each, the other streams are answered.");
    try {
        app.parse(argc, argv);
    } catch (CLI::ParseError const& error) {
        return app.exit(error) == 0 ? ExitDone : ExitFailed;  // help is an error of this parser, with code 0
    }
    for (auto const& [words, work] : works)
        if (words->parsed()) return work();
    return ExitFailed;
}

}  // namespace

int main(int argc, char** argv)
{
    return RunTold([&] {
        TellOfSignals();
        kfshost::Session const session;
        ListenToReports();
        return EndWithExpressions(Run(argc, argv));
    });
}
