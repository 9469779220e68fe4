#include "cli/command.h"
#include "cli/dragplot.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/projectoutput.h"
#include "curves/manipulate.h"
#include "curves/tangents.h"
#include "frame/services/curvekernel.h"
#include "host/framegrid.h"
#include "host/rotations.h"
#include "host/storeerror.h"
#include "keystore/keyflags.h"

#include <fmt/format.h>
#include <fmt/ranges.h>

#include <algorithm>
#include <cmath>
#include <filesystem>
#include <numeric>
#include <optional>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

struct Options {
    Selection selection;
    std::string at;
    std::string fps;  // empty: the rate of the keys
    std::vector<double> to;
    std::string component;  // empty: all of them
    bool path = false;
    std::string plot;  // empty: no drawing
    std::string output;
};

StreamItem const& TheStream(kfshost::Scene const& scene, Selection const& selection)
{
    auto const items = SelectStreams(scene, selection);
    if (items.size() > 1) {
        throw UserError("--stream",
                        fmt::format("{} matches {} streams, and one is dragged at a time: {}, {}{}", selection.glob,
                                    items.size(), items[0]->path, items[1]->path, items.size() > 2 ? " and more" : ""));
    }
    return *items.front();
}

// A drag of one stream, as the words of the command line mean it.
struct Drag {
    StreamItem const* item;
    int units;                    // the time in the stream's scale
    std::vector<double> target;   // what each component is to be there
    std::vector<bool> isDragged;  // each component

    T_Time Time() const { return {units, item->stream->GetTimeScale()}; }
};

int FindUnits(Options const& options, StreamItem const& item)
{
    Rational const fps = options.fps.empty() ? kfshost::FindFrameGrid({&item}).rate : ParseFps(options.fps);
    Rational const time = ParseTime(options.at, "--at", fps);
    auto const span = SpanOf({&item});
    if (!span || kfshost::KeyCount(*item.stream) < 2)
        throw UserError("--at",
                        "the stream has " + Plural(span ? 1 : 0, "key", "keys") + ", so nothing lies between two");
    int const units = time.ToUnits(item.stream->GetTimeScale());
    Rational const held(units, item.stream->GetTimeScale());
    if (held < span->first || span->last < held) {
        throw UserError("--at", fmt::format("{} s isn't between the first key, {} s, and the last, {} s",
                                            TimeText(time), TimeText(span->first), TimeText(span->last)));
    }
    for (int i = 0; i < kfshost::KeyCount(*item.stream); ++i)
        if (kfshost::KeyTime(*item.stream, i) == held)
            throw UserError("--at", "a key stands at " + TimeText(held) + " s; curves are dragged between keys");
    return units;
}

// The target as it is asked for, and what the stream has at the time in the other components.
void FindTarget(Options const& options, Drag& drag)
{
    StreamItem const& item = *drag.item;
    std::size_t const dimension = item.components.size();
    drag.target.resize(dimension);
    drag.isDragged.assign(dimension, options.component.empty());
    kfshost::ReadAt(*item.stream, Rational(drag.units, item.stream->GetTimeScale()), drag.target.data());
    if (!options.component.empty()) {
        auto const place = std::ranges::find(item.components, options.component);
        if (place == item.components.end()) {
            throw UserError("--component", fmt::format("the stream has no {}, but {}", options.component,
                                                       fmt::join(item.components, ", ")));
        }
        drag.isDragged[static_cast<std::size_t>(place - item.components.begin())] = true;
    }
    std::size_t const wanted = static_cast<std::size_t>(std::ranges::count(drag.isDragged, true));
    if (options.to.size() != wanted) {
        std::string const hint = wanted > 1 && !options.path ? "; --component drags one alone" : "";
        throw UserError("--to",
                        fmt::format("{} given, and {} asked for: {}{}",
                                    Plural(options.to.size(), "value is", "values are"), wanted,
                                    options.component.empty() ? fmt::format("{}", fmt::join(item.components, ","))
                                                              : options.component,
                                    hint));
    }
    for (std::size_t c = 0, next = 0; c < dimension; ++c)
        if (drag.isDragged[c]) drag.target[c] = options.to[next++];
}

void CheckForm(Options const& options, StreamItem const& item)
{
    std::string const place = options.selection.ShownFile() + ": " + item.path;
    if (kfshost::IsSeparated(*item.stream))
        throw UserError(place, "is separated, so one of its dimensions can be dragged, and not the whole");
    bool const isFlat = item.stream->IsSpatial() && item.stream->GetDimension() == 2;
    if (options.path && !isFlat) throw UserError("--path", item.path + " isn't held as a path in two dimensions");
    if (options.path && !options.component.empty())
        throw UserError("--component", "chooses one of several curves, so it can't go with --path");
    if (kfshost::IsRotation(item))
        throw UserError(place, "is a rotation, whose components mean something together only");
    if (!options.path && item.stream->IsSpatial())
        throw UserError(place, isFlat ? "is held as a path, which --path drags"
                                      : "is held as a path, and only those in two dimensions can be dragged");
    for (double const value : options.to)
        if (!std::isfinite(value)) throw UserError("--to", "a curve can only be dragged to finite values");
}

// Keys on both sides of which a file has other slopes are corners, and stay such: only of smooth keys does the other side
// turn along.
void KeepCorners(KFS_Stream& stream, Rational const& time)
{
    int next = 0;
    while (kfshost::KeyTime(stream, next) < time) ++next;
    std::vector<double> in(static_cast<std::size_t>(stream.GetDimension()));
    std::vector<double> out(in.size());
    for (int const index : {next - 1, next}) {
        kfshost::ThrowIfFailed(KFS_GetKeyVelocityF(&stream, index, 0, in.data(), out.data()));
        bool const hasTwoSides = index > 0 && index + 1 < kfshost::KeyCount(stream);
        if (hasTwoSides && in != out) kfshost::ThrowIfFailed(KFS_SetKeyContinuous(&stream, 0, index));
    }
}

void Perform(Options const& options, Drag const& drag)
{
    KFS_Stream& stream = *drag.item->stream;
    T_Time time = drag.Time();
    std::vector<double> change = drag.target;
    if (!options.path) {
        std::vector<double> now(change.size());
        kfshost::ReadAt(stream, Rational(drag.units, time.scale), now.data());
        for (std::size_t c = 0; c < change.size(); ++c) change[c] -= now[c];
        KeepCorners(stream, Rational(drag.units, time.scale));
    }
    int const code = KFS_DirectManipArc(&stream, &time, options.path, -1, change.data());
    if (code == CRV_Err_OutOfReach || code == CRV_Err_NotFinite)
        throw UserError("--to", options.path && code == CRV_Err_OutOfReach
                                    ? "the path stands still at that time, so it can't be dragged there"
                                    : "no handles between these two keys carry the curve there");
    kfshost::ThrowIfFailed(code);
}

StreamCurves Sample(Drag const& drag)
{
    std::vector<std::size_t> all(drag.item->components.size());
    std::iota(all.begin(), all.end(), std::size_t{0});
    TimeSpan const span = *SpanOf({drag.item});
    return SampleCurves(*drag.item, all, span, 1200.0 / (span.last - span.first).ToDouble());
}

bool AreOneFile(std::string const& a, std::string const& b)
{
    auto const place = [](std::string const& name) {
        std::error_code ignored;
        return std::filesystem::weakly_canonical(std::filesystem::absolute(name, ignored), ignored);
    };
    return a == b || place(a) == place(b);
}

int Run(Options const& options)
{
    RefuseToOverwrite(options.selection.file, options.output);
    RefuseToOverwrite(options.selection.file, options.plot, "--plot");
    if (!options.plot.empty() && AreOneFile(options.plot, options.output))
        throw UserError("--plot", "the drawing and the project need two names");
    kfshost::Scene scene = LoadScene(options.selection);
    StreamItem const& item = TheStream(scene, options.selection);
    CheckForm(options, item);
    Drag drag{&item, FindUnits(options, item), {}, {}};
    FindTarget(options, drag);
    DragPicture picture{
        item.path,   item.components, {},          {}, static_cast<double>(drag.units) / drag.Time().scale,
        drag.target, drag.isDragged,  options.path};
    if (!options.plot.empty()) picture.before = Sample(drag);
    Perform(options, drag);
    std::string what;  // stays empty where it would stand behind a drawing
    if (options.plot != "-") {
        what = fmt::format("{} dragged to {} at {} s", item.path, fmt::join(options.to, ","),
                           TimeText(Rational(drag.units, static_cast<std::int64_t>(drag.Time().scale))));
    }
    std::optional<WholeFile> drawing;
    if (!options.plot.empty()) {
        picture.after = Sample(drag);
        drawing.emplace(options.plot, DrawDrag(picture));
    }
    // Both files or none, as far as that can be had of two.
    WriteProject(*kfshost::MakeTree(std::move(scene)), options.output, what);
    if (drawing) drawing->Commit();
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    options->selection.forSaving = true;
    AddSelection(command, options->selection);
    command.add_option("--at", options->at, "where: seconds like 0.5 or 1/24, or frames like 12f, between two keys")
        ->required()
        ->type_name("TIME");
    command.add_option("--to", options->to, "the new value there, of each component, like 1.5 or 1,2,3")
        ->required()
        ->delimiter(',')
        ->allow_extra_args(false)
        ->type_name("VALUES");
    command.add_option("--component", options->component, "drag this one alone, like y; the others stay as they are")
        ->type_name("NAME");
    command.add_flag("--path", options->path,
                     "drag the route of a path in two dimensions, to the point that --to gives");
    command.add_option("--plot", options->plot, "also draw the curve before and after into this SVG file")
        ->type_name("SVG");
    command.add_option("--fps", options->fps, "frames a second for --at (default: as the keys lie)")->type_name("RATE");
    AddOutput(command, options->output, "the project file", "PROJECT");
    command.footer(
        "The handles on both sides of the segment move so that the curve passes through the value; keys stay. A\n"
        "segment that is linear or holds becomes a curve, in all components.");
    return [options] { return Run(*options); };
}

}  // namespace

Command const DragCommand{"Make and check projects", "drag", "Drag a curve through a value between two keys", Prepare};
