#include "cli/command.h"
#include "cli/drawing.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/usererror.h"

namespace {

struct Options {
    DrawingOptions drawing;
    std::string output;
    std::string fps = "24";
    bool motion = false;
};

int Run(Options options, bool formGiven)
{
    RefuseToOverwrite(options.drawing.selection.file, options.output);
    options.drawing.fps = ParseFps(options.fps);
    Selection& selection = options.drawing.selection;
    if (options.motion) {
        if (formGiven && !selection.asPaths) throw UserError("--motion", "draws paths, so it can't go with --as plain");
        selection.asPaths = true;
    }
    kfshost::Scene const scene = LoadScene(selection);
    WriteWholeFile(options.output,
                   options.motion ? DrawMotions(options.drawing, scene) : DrawValues(options.drawing, scene));
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    AddSelection(command, options->drawing.selection);
    AddOutput(command, options->output, "the drawing; - for the standard output", "SVG");
    command.add_flag(
        "--motion", options->motion,
        "draw positions as routes in space, with their keys, tangents and a dot a frame, over their speed");
    command.add_flag("--frames", options->drawing.inFrames, "label the time axis in frames");
    command.add_option("--fps", options->fps, "frames a second for --frames and --motion")
        ->type_name("RATE")
        ->capture_default_str();
    return [options, &command] { return Run(*options, command.count("--as") > 0); };
}

}  // namespace

Command const PlotCommand{"Draw", "plot", "Draw value and speed graphs, or motion paths, into an SVG file", Prepare};
