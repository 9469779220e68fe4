#include "cli/drawing.h"
#include "cli/labels.h"
#include "cli/motionsamples.h"
#include "cli/motionviews.h"
#include "cli/output.h"
#include "cli/panel.h"
#include "cli/rates.h"
#include "cli/thin.h"
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
constexpr std::size_t MostKeyTimes = 12;
// In a whole drawing: some 1.5 MB.
constexpr std::size_t MostPoints = 60000;
constexpr double MostDots = 20000.0;
constexpr std::size_t MostMarks = 1000;
constexpr double NoteSize = 12.0;
constexpr double DotRadius = 2.3;

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
    Motion(StreamItem const& ofItem, TimeSpan const& ofPart, double pointsPerSecond)
        : item(ofItem),
          part(ofPart),
          samples(SampleMotion(ofItem, ofPart, pointsPerSecond))
    {
        for (MotionSegment const& segment : samples.segments) {
            hasJumps = hasJumps || segment.isJump;
            for (std::size_t i = 1; i < segment.route.size(); ++i)
                (segment.isJump ? jumped : length) += DistanceBetween(segment.route[i - 1], segment.route[i]);
        }
    }

    // How far apart keys are on average; nothing where they are too many for marks anyway.
    double KeyDistance(double unitsPerPixel) const
    {
        if (samples.keys.size() > MostMarks) return 0.0;
        return (length + jumped) / unitsPerPixel /
               static_cast<double>(std::max<std::size_t>(samples.segments.size(), 1));
    }

    // The tangents take part: they have to be in sight where they are drawn.
    Extents Box() const
    {
        std::vector<Place> places;
        for (MotionSegment const& segment : samples.segments)
            places.insert(places.end(), segment.route.begin(), segment.route.end());
        for (MotionKey const& key : samples.keys) places.insert(places.end(), {key.place, key.inEnd, key.outEnd});
        Extents box{places.front(), places.front()};
        for (Place const& place : places) {
            for (std::size_t i = 0; i < 3; ++i) {
                box.low[i] = std::min(box.low[i], place[i]);
                box.high[i] = std::max(box.high[i], place[i]);
            }
        }
        return box;
    }

    StreamItem const& item;
    TimeSpan part;
    MotionSamples samples;
    double length = 0.0;  // of the route
    double jumped = 0.0;
    bool hasJumps = false;
};

// Every frame, or every so many that the dots stay apart.
Rational DotStep(Motion const& motion, Rational const& fps, double unitsPerPixel)
{
    double const seconds = (motion.part.last - motion.part.first).ToDouble();
    double const room =
        std::clamp(motion.length / unitsPerPixel / LeastDotDistance, motion.hasJumps ? MostDots : 1.0, MostDots);
    std::int64_t frames = 1;
    for (std::int64_t const factor : {2, 5, 10, 20, 50, 100, 200, 500, 1000, 10000, 100000})
        if (seconds * fps.ToDouble() / static_cast<double>(frames) > room) frames = factor;
    return Rational(frames, 1) / fps;
}

// Steps are counted from time 0, as frames are.
std::vector<Place> Dots(Motion const& motion, Rational const& step)
{
    Rational const first = motion.part.first / step;
    Rational const last = motion.part.last / step;
    std::vector<Rational> times;
    for (std::int64_t i = first.Numerator() / first.Denominator(); Rational(i, 1) <= last; ++i)
        if (Rational(i, 1) >= first) times.push_back(Rational(i, 1) * step);
    return PlacesAt(motion.item, times);
}

// The routes between jumps, each in one piece.
std::vector<std::vector<Point>> LinesOf(Motion const& motion, PlacedView const& view, bool jumps)
{
    std::vector<std::vector<Point>> lines;
    bool goesOn = false;
    for (MotionSegment const& segment : motion.samples.segments) {
        if (segment.isJump == jumps) {
            if (!goesOn) lines.emplace_back();
            for (Place const& place : segment.route) lines.back().push_back(view.At(place));
        }
        goesOn = segment.isJump == jumps;
    }
    return lines;
}

class MotionPlot {
public:
    MotionPlot(DrawingOptions const& options, kfshost::Scene const& scene, std::vector<StreamItem const*> const& all)
        : options_(options),
          unit_(MakeTimeUnit(options)),
          shown_(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(std::min(all.size(), MostStreams))),
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
        Axis const time = MakeTimeAxis(options_, shown_, item.animation);
        double const pointsPerUnit = (PanelRight - PanelLeft) / (time.High() - time.Low());
        Motion const motion(item, options_.Cut(*SpanOf({&item})), pointsPerUnit * unit_.perSecond);
        svg_.Text({PanelLeft, top_ + 14}, ShortenedPath(item.path), {15.0, "#111111", Anchor::Start, true});
        top_ += TitleHeight;
        MotionLayout const layout = LayOutViews(motion.Box(), top_, options_.selection.ShownFile() + ": " + item.path);
        double const keyDistance = motion.KeyDistance(layout.unitsPerPixel);
        Rational const step = DotStep(motion, options_.fps, layout.unitsPerPixel);
        std::vector<Place> const dots = Dots(motion, step);
        double right = 0.0;
        for (PlacedView const& view : layout.views) {
            DrawView(view, motion, dots, keyDistance, MostPoints / shown_.size() / (layout.views.size() + 1));
            right = std::max(right, view.panel->Box().left + view.panel->Box().width);
        }
        double const legendBottom = DrawLegend(motion, step, keyDistance, right);
        top_ = std::max(top_ + layout.height, legendBottom) + SpeedGap;
        DrawSpeed(motion, time);
        top_ += SpeedHeight + AxisHeight;
    }

    void DrawView(PlacedView const& view, Motion const& motion, std::vector<Place> const& dots, double keyDistance,
                  std::size_t mostPoints)
    {
        static constexpr char const* axes[] = {"x", "y", "z"};
        view.panel->DrawFrame(svg_, std::string(view.view.caption));
        view.panel->DrawLabelsBelow(svg_, axes[view.view.right]);
        Labels labels(view.panel->Box(), NoteSize);
        for (bool const jumps : {false, true}) {
            auto lines = LinesOf(motion, view, jumps);
            for (auto& line : lines) {
                line = ThinRoute(std::move(line), std::max<std::size_t>(mostPoints / lines.size(), 2));
                labels.AvoidLine(line);
                svg_.Polyline(line, jumps ? JumpPen : Pen{RouteColor, 3.0});
            }
        }
        if (keyDistance >= LeastTangentDistance) DrawTangents(view, motion, labels);
        std::vector<Point> places;
        for (Place const& dot : dots) places.push_back(view.At(dot));
        svg_.Dots(places, DotRadius, DotColor);
        DrawKeys(view, motion, keyDistance, labels);
    }

    void DrawTangents(PlacedView const& view, Motion const& motion, Labels& labels)
    {
        for (MotionKey const& key : motion.samples.keys) {
            for (Place const& end : {key.inEnd, key.outEnd}) {
                if (end == key.place) continue;
                Point const line[] = {view.At(key.place), view.At(end)};
                DrawTangent(svg_, line[0], line[1]);
                labels.AvoidLine(line);
            }
        }
    }

    // Where keys are too many the ends alone stay: they tell the direction.
    void DrawKeys(PlacedView const& view, Motion const& motion, double keyDistance, Labels& labels)
    {
        auto const& keys = motion.samples.keys;
        bool const timesFit = keys.size() <= MostKeyTimes;
        double const radius = std::clamp(keyDistance / 3, 5.0, 7.0);
        std::vector<Note> notes;
        for (MotionKey const& key : keys) {
            if (!key.isEnd && keyDistance < LeastKeyDistance) continue;
            Point const at = view.At(key.place);
            DrawMark(key, at, radius);
            labels.AvoidPoint(at);
            if (key.isEnd || timesFit) AddNote(notes, at, TimeOf(key));
        }
        for (Note const& note : notes)
            svg_.Text(labels.Place(note.at, radius, note.text), note.text,
                      {NoteSize, "#333333", Anchor::Middle, false, true});
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

    // Beside the views. Returns its lower end.
    double DrawLegend(Motion const& motion, Rational const& step, double keyDistance, double right)
    {
        double const left = right + 22;
        double y = top_ + 40;
        auto const line = [&](std::string const& text, auto&& draw) {
            draw(Point{left + 16, y});
            svg_.Text({left + 42, y + 4.5}, text, {13.0, "#222222"});
            y += 24;
        };
        auto const stroke = [&](Pen const& pen) {
            return [this, pen](Point at) { svg_.Line({at.x - 16, at.y}, {at.x + 16, at.y}, pen); };
        };
        if (motion.length > 0.0) line("route", stroke({RouteColor, 3.0}));
        if (motion.hasJumps) line("jump", stroke(JumpPen));
        line(DotText(step), [&](Point at) { svg_.Dots({&at, 1}, DotRadius, DotColor); });
        bool const drawn = keyDistance >= LeastKeyDistance;
        line(drawn ? "key" : "first, last key", [&](Point at) { DrawKey(svg_, at, 6.0); });
        if (drawn && kfshost::FloatKeyCount(*motion.item.stream) > 0)
            line("float key", [&](Point at) { DrawFloatKey(svg_, at); });
        if (keyDistance >= LeastTangentDistance && std::ranges::any_of(motion.samples.keys, HasTangents))
            line("tangent", [&](Point at) { DrawTangent(svg_, {at.x - 14, at.y}, {at.x + 14, at.y}); });
        svg_.Text({left, y + 16}, Plural(motion.samples.keys.size(), "key", "keys"), {13.0, "#666666"});
        if (motion.length > 0.0)
            svg_.Text({left, y + 36}, fmt::format("{:.4g} units long", motion.length), {13.0, "#666666"});
        return y + 46;
    }

    std::string DotText(Rational const& step) const
    {
        Rational const frames = step * options_.fps;
        return frames == Rational(1, 1) ? fmt::format("each frame, {} s", TimeText(step))
                                        : fmt::format("each {} frames, {} s", frames.ToString(), TimeText(step));
    }

    void DrawSpeed(Motion const& motion, Axis const& time)
    {
        double const highest = RatesInSight(motion.samples.speed).high;
        double peak = 0.0;
        for (Point const& point : motion.samples.speed)
            if (point.y > highest) peak = std::max(peak, point.y);
        Axis const speeds(0.0, highest == 0.0 ? 1.0 : highest * 1.1, 6);
        Panel const panel({PanelLeft, top_, PanelRight - PanelLeft, SpeedHeight}, time, speeds);
        panel.DrawFrame(svg_, "speed along the path, distance a second" + PeakNote(peak));
        panel.DrawLabelsBelow(svg_, unit_.name);
        std::vector<Point> line;
        for (Point const& point : motion.samples.speed)
            line.push_back({panel.X(point.x * unit_.perSecond), panel.Held(panel.Y(point.y))});
        svg_.Polyline(ThinGraph(std::move(line), MostPoints / shown_.size() / 4), {SpeedColor, 2.0});
        auto const& keys = motion.samples.keys;
        double const room = (PanelRight - PanelLeft) / static_cast<double>(std::max<std::size_t>(keys.size(), 1));
        for (MotionKey const& key : keys)
            if (key.isEnd || room >= LeastTangentDistance)
                DrawMark(key, {panel.X(key.seconds * unit_.perSecond), panel.Bottom()}, 6.0);
    }

    DrawingOptions const& options_;
    TimeUnit unit_;
    std::vector<StreamItem const*> shown_;
    Svg svg_;
    double top_;
};

}  // namespace

std::string DrawMotions(DrawingOptions const& options, kfshost::Scene const& scene)
{
    return MotionPlot(options, scene, StreamsToDraw(options, scene, true)).Draw();
}
