#include "cli/drawing.h"
#include "cli/motionsamples.h"
#include "cli/motionviews.h"
#include "cli/panel.h"
#include "cli/usererror.h"
#include "host/paths.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

constexpr std::size_t MostStreams = 3;

constexpr double HeaderHeight = 66.0;
constexpr double TitleHeight = 26.0;
constexpr double SpeedGap = 40.0;
constexpr double SpeedHeight = 170.0;
constexpr double AxisHeight = 78.0;

// Keys closer than this on average hide the route; tangents take more room.
constexpr double LeastKeyDistance = 16.0;
constexpr double LeastTangentDistance = 24.0;
constexpr double LeastDotDistance = 7.0;
constexpr double MostDots = 20000.0;
constexpr std::size_t MostKeyTimes = 12;

constexpr std::string_view RouteColor = "#9cc0e0";
constexpr std::string_view DotColor = "#174a7a";
constexpr std::string_view KeyColor = "#d1432b";
constexpr std::string_view TangentColor = "#b97800";
constexpr std::string_view SpeedColor = "#1f6fb5";
constexpr Pen JumpPen{"#9a9a9a", 1.3, "3 5"};

void DrawFloatKey(Svg& svg, Point at)
{
    svg.Circle(at, 5.0, "#ffffff", {KeyColor, 2.2});
}

void DrawKey(Svg& svg, Point at, double radius)
{
    svg.Diamond(at, radius, KeyColor, {"#ffffff", 1.2});
}

void DrawDot(Svg& svg, Point at)
{
    svg.Circle(at, 2.3, DotColor, {"none"});
}

void DrawTangent(Svg& svg, Point key, Point end)
{
    svg.Line(key, end, {TangentColor, 1.4});
    svg.Circle(end, 3.5, "#ffffff", {TangentColor, 1.5});
}

bool HasTangents(MotionKey const& key)
{
    return key.inEnd != key.place || key.outEnd != key.place;
}

// The motion of one stream, with what the drawing needs to know about it.
class Motion {
public:
    Motion(StreamItem const& ofItem, double pointsPerSecond)
        : item(ofItem),
          samples(SampleMotion(ofItem, pointsPerSecond))
    {
        for (MotionSegment const& segment : samples.segments) {
            hasJumps = hasJumps || segment.isJump;
            for (std::size_t i = 1; i < segment.route.size(); ++i)
                (segment.isJump ? jumped : length) += DistanceBetween(segment.route[i - 1], segment.route[i]);
        }
    }

    double KeyDistance(double unitsPerPixel) const
    {
        return (length + jumped) / unitsPerPixel /
               static_cast<double>(std::max<std::size_t>(samples.segments.size(), 1));
    }

    // The tangents take part: they have to be in sight where they are drawn.
    Extents Box() const
    {
        Extents box{samples.keys.front().place, samples.keys.front().place};
        auto const add = [&box](Place const& place) {
            for (std::size_t i = 0; i < 3; ++i) {
                box.low[i] = std::min(box.low[i], place[i]);
                box.high[i] = std::max(box.high[i], place[i]);
            }
        };
        for (MotionKey const& key : samples.keys) {
            add(key.place);
            add(key.inEnd);
            add(key.outEnd);
        }
        return box;
    }

    StreamItem const& item;
    MotionSamples samples;
    double length = 0.0;  // of the route
    double jumped = 0.0;
    bool hasJumps = false;
};

// Every frame, or every so many that the dots stay apart.
Rational DotStep(Motion const& motion, Rational const& fps, double unitsPerPixel)
{
    double const seconds = motion.samples.keys.back().seconds - motion.samples.keys.front().seconds;
    double const room =
        std::clamp(motion.length / unitsPerPixel / LeastDotDistance, motion.hasJumps ? MostDots : 1.0, MostDots);
    std::int64_t frames = 1;
    for (std::int64_t const factor : {2, 5, 10, 20, 50, 100, 200, 500, 1000, 10000, 100000})
        if (seconds * fps.ToDouble() / static_cast<double>(frames) > room) frames = factor;
    return Rational(frames, 1) / fps;
}

std::vector<Place> Dots(Motion const& motion, Rational const& step)
{
    KFS_Stream const& stream = *motion.item.stream;
    Rational const first = kfshost::KeyTime(stream, 0);
    Rational const last = kfshost::KeyTime(stream, kfshost::KeyCount(stream) - 1);
    Rational const steps = (last - first) / step;
    std::vector<Rational> times;
    for (std::int64_t i = 0; i <= steps.Numerator() / steps.Denominator(); ++i)
        times.push_back(first + Rational(i, 1) * step);
    return PlacesAt(motion.item, times);
}

class MotionPlot {
public:
    MotionPlot(DrawingOptions const& options, kfshost::Scene const& scene, std::vector<StreamItem const*> const& all)
        : fps_(options.fps),
          unit_(MakeTimeUnit(options)),
          shown_(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(std::min(all.size(), MostStreams))),
          time_(MakeTimeAxis(unit_, shown_)),
          top_(HeaderHeight)
    {
        svg_.Text({PanelLeft, 38}, scene.name, {22.0, "#111111", Anchor::Start, true});
        if (all.size() > shown_.size()) {
            svg_.Text({PanelLeft, 58},
                      fmt::format("the first {} of {} positions with keys; --stream chooses others", shown_.size(),
                                  all.size()),
                      {13.0, "#666666"});
        }
    }

    std::string Draw()
    {
        for (StreamItem const* item : shown_) DrawMotion(*item);
        return svg_.Finish(DrawingWidth, top_);
    }

private:
    void DrawMotion(StreamItem const& item)
    {
        double const pointsPerUnit = (PanelRight - PanelLeft) / (time_.High() - time_.Low());
        Motion const motion(item, pointsPerUnit * unit_.perSecond);
        svg_.Text({PanelLeft, top_ + 14}, ShortenedPath(item.path), {15.0, "#111111", Anchor::Start, true});
        top_ += TitleHeight;
        MotionLayout const layout = LayOutViews(motion.Box(), top_);
        Rational const step = DotStep(motion, fps_, layout.unitsPerPixel);
        std::vector<Place> const dots = Dots(motion, step);
        for (PlacedView const& view : layout.views)
            DrawView(view, motion, dots, motion.KeyDistance(layout.unitsPerPixel));
        DrawLegend(motion, step, motion.KeyDistance(layout.unitsPerPixel));
        top_ += layout.height + SpeedGap;
        DrawSpeed(motion);
        top_ += SpeedHeight + AxisHeight;
    }

    void DrawView(PlacedView const& view, Motion const& motion, std::vector<Place> const& dots, double keyDistance)
    {
        static constexpr char const* axes[] = {"x", "y", "z"};
        view.panel->DrawFrame(svg_, std::string(view.view.caption));
        view.panel->DrawLabelsBelow(svg_, axes[view.view.right]);
        for (MotionSegment const& segment : motion.samples.segments) {
            std::vector<Point> route;
            for (Place const& place : segment.route) route.push_back(view.At(place));
            svg_.Polyline(route, segment.isJump ? JumpPen : Pen{RouteColor, 3.0});
        }
        if (keyDistance >= LeastTangentDistance) DrawTangents(view, motion);
        for (Place const& dot : dots) DrawDot(svg_, view.At(dot));
        DrawKeys(view, motion, keyDistance);
    }

    void DrawTangents(PlacedView const& view, Motion const& motion)
    {
        for (MotionKey const& key : motion.samples.keys) {
            for (Place const& end : {key.inEnd, key.outEnd})
                if (end != key.place) DrawTangent(svg_, view.At(key.place), view.At(end));
        }
    }

    // Where keys are too many the ends alone stay: they tell the direction.
    void DrawKeys(PlacedView const& view, Motion const& motion, double keyDistance)
    {
        auto const& keys = motion.samples.keys;
        bool const timesFit = keys.size() <= MostKeyTimes;
        std::vector<Note> notes;
        for (std::size_t i = 0; i < keys.size(); ++i) {
            bool const isEnd = i == 0 || i + 1 == keys.size();
            if (!isEnd && keyDistance < LeastKeyDistance) continue;
            Point const at = view.At(keys[i].place);
            DrawMark(keys[i], at, std::clamp(keyDistance / 3, 5.0, 7.0));
            if (isEnd || timesFit) AddNote(notes, at, TimeOf(keys[i]));
        }
        for (Note const& note : notes)
            svg_.Text({note.at.x, note.at.y + 21}, note.text, {12.0, "#333333", Anchor::Middle, false, true});
    }

    void DrawMark(MotionKey const& key, Point at, double radius)
    {
        if (key.floats)
            DrawFloatKey(svg_, at);
        else
            DrawKey(svg_, at, radius);
    }

    struct Note {
        Point at;
        std::string text;
    };

    // Keys on one spot share a note.
    static void AddNote(std::vector<Note>& notes, Point at, std::string const& text)
    {
        constexpr double near = 12.0;
        for (Note& note : notes) {
            if (std::abs(note.at.x - at.x) < near && std::abs(note.at.y - at.y) < near) {
                note.text += ", " + text;
                return;
            }
        }
        notes.push_back({at, text});
    }

    std::string TimeOf(MotionKey const& key) const
    {
        return unit_.leastStep == 0.0 ? fmt::format("{:.4g} s", key.seconds)
                                      : fmt::format("{:.4g}", key.seconds * unit_.perSecond);
    }

    void DrawLegend(Motion const& motion, Rational const& step, double keyDistance)
    {
        double const left = PanelRight + 22;
        double y = top_ + 40;
        auto const line = [&](std::string const& text, auto&& draw) {
            draw(Point{left + 16, y});
            svg_.Text({left + 42, y + 4.5}, text, {13.0, "#222222"});
            y += 24;
        };
        if (motion.length > 0.0)
            line("route", [&](Point at) { svg_.Line({at.x - 16, at.y}, {at.x + 16, at.y}, {RouteColor, 3.0}); });
        if (motion.hasJumps)
            line(
                "jump",
                [&](Point at) {
                    svg_.Line({at.x - 16, at.y}, {at.x + 16, at.y}, JumpPen);
                });
        line(fmt::format("every {} s", TimeText(step)), [&](Point at) { DrawDot(svg_, at); });
        bool const drawn = keyDistance >= LeastKeyDistance;
        line(drawn ? "key" : "first, last key", [&](Point at) { DrawKey(svg_, at, 6.0); });
        if (drawn && kfshost::FloatKeyCount(*motion.item.stream) > 0)
            line("float key", [&](Point at) { DrawFloatKey(svg_, at); });
        if (keyDistance >= LeastTangentDistance && std::ranges::any_of(motion.samples.keys, HasTangents))
            line("tangent", [&](Point at) { DrawTangent(svg_, {at.x - 14, at.y}, {at.x + 14, at.y}); });
        svg_.Text({left, y + 16}, fmt::format("{} keys", motion.samples.keys.size()), {13.0, "#666666"});
        if (motion.length > 0.0)
            svg_.Text({left, y + 36}, fmt::format("{:.4g} units long", motion.length), {13.0, "#666666"});
    }

    void DrawSpeed(Motion const& motion)
    {
        double highest = 0.0;
        for (Point const& point : motion.samples.speed) highest = std::max(highest, point.y);
        Axis const speeds(0.0, highest == 0.0 ? 1.0 : highest * 1.1, 6);
        Panel const panel({PanelLeft, top_, PanelRight - PanelLeft, SpeedHeight}, time_, speeds);
        panel.DrawFrame(svg_, "speed along the path, distance a second");
        panel.DrawLabelsBelow(svg_, unit_.name);
        std::vector<Point> line;
        for (Point const& point : motion.samples.speed)
            line.push_back({panel.X(point.x * unit_.perSecond), panel.Y(point.y)});
        svg_.Polyline(line, {SpeedColor, 2.0});
        auto const& keys = motion.samples.keys;
        double const room = (PanelRight - PanelLeft) / static_cast<double>(keys.size());
        for (std::size_t i = 0; i < keys.size() && room >= LeastTangentDistance; ++i) {
            Point const at{panel.X(keys[i].seconds * unit_.perSecond), panel.Bottom()};
            DrawMark(keys[i], at, 6.0);
        }
    }

    Rational fps_;
    TimeUnit unit_;
    std::vector<StreamItem const*> shown_;
    Svg svg_;
    Axis time_;
    double top_;
};

}  // namespace

std::string DrawMotions(DrawingOptions const& options, kfshost::Scene const& scene)
{
    auto items = SelectStreams(scene, options.selection);
    std::erase_if(items, [](StreamItem const* item) {
        return !item->stream->IsSpatial() || kfshost::KeyCount(*item->stream) == 0;
    });
    if (items.empty()) throw UserError(options.selection.file, "the chosen streams have no keys to draw");
    return MotionPlot(options, scene, items).Draw();
}
