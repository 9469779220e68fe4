#include "cli/command.h"
#include "cli/drawing.h"
#include "cli/expressions.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/usererror.h"
#include "host/framegrid.h"

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <optional>

using kfshost::Rational;

namespace {

struct Options {
    DrawingOptions drawing;
    std::string output;
    std::string fps;  // empty: the rate of the keys
    std::string from;
    std::string to;
    bool motion = false;
};

// Whatever else a name ends in, it is taken for one of an SVG file.
void RefuseOtherKinds(std::string const& output)
{
    std::string ending = std::filesystem::path(output).extension().string();
    std::ranges::transform(ending, ending.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    for (char const* other :
         {".png", ".jpg", ".jpeg", ".gif", ".webp", ".bmp", ".tif", ".tiff", ".pdf", ".ps", ".eps", ".svgz", ".html"}) {
        if (ending == other)
            throw UserError(
                "-o",
                '"' + output +
                    "\" is no name for an SVG file, and no other kind is written; rsvg-convert makes others of one");
    }
}

void ReadPart(Options const& options, DrawingOptions& drawing)
{
    if (!options.from.empty()) drawing.from = ParseTime(options.from, "--from", drawing.fps);
    if (!options.to.empty()) drawing.to = ParseTime(options.to, "--to", drawing.fps);
    if (drawing.from && drawing.to && *drawing.to <= *drawing.from)
        throw UserError("--to", TimeText(*drawing.to) + " s isn't after --from, " + TimeText(*drawing.from) + " s");
}

int Run(Options const& options, bool formGiven)
{
    DrawingOptions drawing = options.drawing;
    RefuseToOverwrite(drawing.selection.file, options.output);
    RefuseOtherKinds(options.output);
    if (options.motion) {
        if (formGiven && !drawing.selection.asPaths)
            throw UserError("--motion", "draws paths, so it can't go with --as plain");
        if (!drawing.components.empty())
            throw UserError("--components", "chooses curves, so it can't go with --motion");
        drawing.selection.asPaths = true;
    }
    std::optional<Rational> const fps = options.fps.empty() ? std::nullopt : std::optional(ParseFps(options.fps));
    kfshost::Scene const scene = LoadScene(drawing.selection);
    drawing.fps = fps ? *fps : kfshost::FindFrameGrid(SelectStreams(scene, drawing.selection)).rate;
    ReadPart(options, drawing);
    auto const draw = [&] {
        return Fitting("--fps",
                       [&] { return options.motion ? DrawMotions(drawing, scene) : DrawValues(drawing, scene); });
    };
    std::string svg = draw();
    while (TellFailedExpressions(drawing.selection)) svg = draw();  // those that failed as their keys
    WriteWholeFile(options.output, svg);
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    AddSelection(command, options->drawing.selection);
    AddNoExpressions(command, options->drawing.selection);
    AddOutput(command, options->output, "the drawing; - for the standard output", "SVG");
    command.add_flag(
        "--motion", options->motion,
        "draw positions as routes in space, with their keys, tangents and a dot a frame, over their speed");
    command.add_option("--from", options->from, "draw from this time on: seconds like 0.5 or 1/24, or frames like 12f")
        ->type_name("TIME");
    command.add_option("--to", options->to, "draw to this time")->type_name("TIME");
    command.add_option("--components", options->drawing.components, "draw only the curves of these, like x,y")
        ->delimiter(',')
        ->allow_extra_args(false)
        ->type_name("NAMES");
    command.add_flag("--frames", options->drawing.inFrames, "label the time axis in frames");
    command
        .add_option("--fps", options->fps,
                    "frames a second for --frames, --motion and times (default: as the keys lie)")
        ->type_name("RATE");
    return [options, &command] { return Run(*options, command.count("--as") > 0); };
}

}  // namespace

Command const PlotCommand{"Draw", "plot", "Draw value and speed graphs, or motion paths, into an SVG file", Prepare};
