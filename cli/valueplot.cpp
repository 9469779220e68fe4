#include "cli/axis.h"
#include "cli/curvesamples.h"
#include "cli/drawing.h"
#include "cli/panel.h"
#include "cli/rates.h"
#include "cli/thin.h"
#include "cli/usererror.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <cmath>

using kfshost::StreamItem;

namespace {

constexpr std::size_t MostStreams = 6;
constexpr std::size_t MostCurves = 14;  // of one stream: as many as the legend has lines
// In a whole drawing: some 1.4 MB of points, and some 0.4 MB of marks.
constexpr std::size_t PointsInSight = 5000;  // of one curve: four in each column of pixels
constexpr std::size_t MostPoints = 90000;
constexpr std::size_t MostMarks = 4000;

constexpr double Left = PanelLeft;
constexpr double Right = PanelRight;
constexpr double HeaderHeight = 76.0;
constexpr double TitleHeight = 40.0;
constexpr double ValueHeight = 300.0;
constexpr double PanelGap = 30.0;
constexpr double SpeedHeight = 150.0;
constexpr double ConstantHeight = 64.0;  // of a graph in which nothing changes
constexpr double AxisHeight = 62.0;
constexpr double BandHeight = 9.0;
constexpr std::string_view BandColor = "#c9cdd2";

// Told apart in print and by eyes that don't tell red from green; x, y and z come near their usual red, green and blue.
constexpr std::array<std::string_view, 8> Colors{"#d1432b", "#17915f", "#1f6fb5", "#c07a00",
                                                 "#8a4fa8", "#3a3a3a", "#2aa7c9", "#b0397e"};
constexpr std::array<std::string_view, 3> Dashes{"", "9 4", "2 4"};
// For a curve on top of one, two or more others: their colours show in the gaps.
constexpr std::array<std::string_view, 3> OverlapDashes{"14 14", "14 28", "14 42"};

// A graph isn't blown up to show less than this share of its numbers: below lies the noise of 32-bit floats, and far
// below is what doesn't change.
constexpr double LeastShare = 1e-4;
constexpr double ConstantShare = 1e-6;
// Curves that are nowhere further apart look like one.
constexpr double LeastDistance = 1.5;
// Below this distance keys are no marks of their own any more.
constexpr double LeastKeyDistance = 4.0;
constexpr double LeastHandleDistance = 14.0;

using CurvePoints = std::vector<Point> ComponentCurve::*;

// What a line says at a time, from the left and from the right: two values where it jumps.
struct Sides {
    double left;
    double right;
};

Sides SidesAt(std::vector<Point> const& line, double x)
{
    auto const first = std::ranges::lower_bound(line, x, {}, &Point::x);
    auto const last = std::ranges::upper_bound(line, x, {}, &Point::x);
    if (first != last) return {first->y, last[-1].y};
    if (first == line.begin() || first == line.end()) {
        double const held = first == line.begin() ? first->y : last[-1].y;
        return {held, held};
    }
    Point const& before = first[-1];
    double const y = before.y + (first->y - before.y) * ((x - before.x) / (first->x - before.x));
    return {y, y};
}

// Whether no point of a line is farther than that above or below another line.
bool LiesOn(std::vector<Point> const& a, std::vector<Point> const& b, double tolerance)
{
    return std::ranges::all_of(
        a,
        [&](Point const& point) {
            Sides const sides = SidesAt(b, point.x);
            return std::min(std::abs(point.y - sides.left), std::abs(point.y - sides.right)) <= tolerance;
        });
}

// How alike two curves are: as far apart as `tolerance` nowhere. At 0 they are one. Each has points where it bends.
bool Coincide(std::vector<Point> const& a, std::vector<Point> const& b, double tolerance)
{
    if (&a == &b) return true;
    if (a.empty() || b.empty()) return a.empty() && b.empty();
    return LiesOn(a, b, tolerance) && LiesOn(b, a, tolerance);
}

// The first component whose curve lies on that of `component`, which may be itself.
std::size_t FirstAlike(StreamCurves const& curves, std::size_t component, CurvePoints points, double tolerance)
{
    std::size_t d = 0;
    while (!Coincide(curves.components[d].*points, curves.components[component].*points, tolerance)) ++d;
    return d;
}

// How many curves lie there already before that of `component` comes.
std::size_t CountAlike(StreamCurves const& curves, std::size_t component, CurvePoints points, double tolerance)
{
    std::size_t count = 0;
    for (std::size_t d = 0; d < component; ++d)
        count += Coincide(curves.components[d].*points, curves.components[component].*points, tolerance) ? 1 : 0;
    return count;
}

// Components that belong to an axis have its colour wherever they stand; others have one by their place.
std::string_view ColorOf(StreamItem const& item, std::size_t component)
{
    char const letter = item.components[component].front();
    std::size_t const axis = std::string_view("XYZ").find(letter);
    std::size_t const place = IsFollower(item) ? static_cast<std::size_t>(item.component) : component;
    return Colors[axis == std::string_view::npos ? place % Colors.size() : axis];
}

// What is drawn of one stream.
struct Drawn {
    StreamItem const* item;
    std::vector<std::size_t> components;
    std::size_t left;  // how many more there are

    std::string const& Name(std::size_t d) const { return item->components[components[d]]; }
    std::string_view Color(std::size_t d) const { return ColorOf(*item, components[d]); }
};

std::vector<std::size_t> ChosenComponents(StreamItem const& item, std::vector<std::string> const& names)
{
    std::vector<std::size_t> chosen;
    for (std::size_t d = 0; d < item.components.size(); ++d)
        if (names.empty() || std::ranges::find(names, item.components[d]) != names.end()) chosen.push_back(d);
    return chosen;
}

class Plot {
public:
    Plot(DrawingOptions const& options, kfshost::Scene const& scene, std::vector<StreamItem const*> const& all)
        : options_(options),
          unit_(MakeTimeUnit(options)),
          shown_(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(std::min(all.size(), MostStreams)))
    {
        std::size_t curves = 0;
        for (StreamItem const* item : shown_) {
            std::vector<std::size_t> components = ChosenComponents(*item, options.components);
            std::size_t const left = components.size() - std::min(components.size(), MostCurves);
            components.resize(components.size() - left);
            curves += components.size();
            drawn_.push_back({item, std::move(components), left});
        }
        pointsOfCurve_ = std::min(MostPoints / (2 * curves), PointsInSight);
        marksOfCurve_ = MostMarks / curves;
        DrawHeader(scene.name, all.size());
    }

    std::string Draw()
    {
        double top = HeaderHeight;
        for (Drawn const& drawn : drawn_) top = DrawStream(drawn, top);
        DrawMarkLegend();
        return svg_.Finish(DrawingWidth, top);
    }

private:
    void DrawHeader(std::string const& name, std::size_t selected)
    {
        svg_.Text({Left, 38}, name, {22.0, "#111111", Anchor::Start, true});
        if (selected > shown_.size()) {
            svg_.Text(
                {Left, 60},
                fmt::format("the first {} of {} streams with keys; --stream chooses others", shown_.size(), selected),
                {13.0, "#666666"});
        }
    }

    // What the marks mean that are there, from the right to the left.
    void DrawMarkLegend()
    {
        double const y = 33;
        double x = Right;
        auto const entry = [&](std::string_view text, double width, auto&& draw) {
            x -= width;
            svg_.Text({x, y + 4.5}, text, {13.0, "#444444"});
            x -= 12;
            draw();
            x -= 44;
        };
        if (drewHandles_) {
            entry("handle", 48, [&] {
                svg_.Line({x - 34, y}, {x, y}, {"#555555", 1.2});
                svg_.Circle({x, y}, 3.5, "#ffffff", {"#555555", 1.4});
            });
            x -= 20;
        }
        if (drewBand_) {
            entry(
                "keys, too close to be told apart", 222,
                [&] {
                    svg_.Rectangle({x - 30, y - BandHeight / 2}, 30, BandHeight, BandColor, {"none"});
                });
            entry("first, last key", 96, [&] { svg_.Diamond({x, y}, 5.5, "#555555", {"#ffffff", 1.2}); });
        }
        if (drewKeys_) entry("key", 24, [&] { svg_.Diamond({x, y}, 5.5, "#555555", {"#ffffff", 1.2}); });
    }

    // Returns where the next one begins.
    double DrawStream(Drawn const& drawn, double top)
    {
        StreamItem const& item = *drawn.item;
        bool const isAngle = item.kind == kfshost::StreamKind::Angles;
        Axis const time = MakeTimeAxis(options_, shown_, item.animation);
        double const pixelsPerSecond = (Right - Left) / (time.High() - time.Low()) * unit_.perSecond;
        svg_.Text({Left, top + 14}, ShortenedPath(item.path), {15.0, "#111111", Anchor::Start, true});
        TimeSpan const part = options_.Cut(*SpanOf({&item}));
        StreamCurves const curves = SampleCurves(item, drawn.components, part, pixelsPerSecond);
        Spacing const spacing = SpacingOf(curves, pixelsPerSecond);

        Axis const values = ValueAxis(item, curves, spacing.showHandles);
        Panel const valuePanel({Left, top + TitleHeight, Right - Left, HeightOf(values, ValueHeight)}, time, values);
        valuePanel.DrawFrame(svg_, std::string(NameOf(item.kind)) + (isAngle ? " in degrees, " : ", ") +
                                       std::string(NameOf(item.interpolation)) +
                                       (kfshost::IsSeparated(*item.stream) ? ", separated"
                                        : item.stream->IsSpatial()         ? " along a path"
                                                                           : ""));
        DrawCurves(valuePanel, drawn, curves, &ComponentCurve::value);
        DrawKeys(valuePanel, drawn, curves, spacing);
        double const legendBottom = DrawLegend(drawn, curves, valuePanel);

        double peak = 0.0;
        Axis const speeds = SpeedAxis(item, curves, values, time, &peak);
        Panel const speedPanel({Left, valuePanel.Bottom() + PanelGap, Right - Left, HeightOf(speeds, SpeedHeight)},
                               time, speeds);
        speedPanel.DrawFrame(svg_, std::string(isAngle ? "speed, degrees a second" : "speed, units a second") +
                                       PeakNote(peak));
        DrawCurves(speedPanel, drawn, curves, &ComponentCurve::speed);
        speedPanel.DrawLabelsBelow(svg_, unit_.name);
        return std::max(speedPanel.Bottom() + AxisHeight, legendBottom);
    }

    static double HeightOf(Axis const& axis, double usual) { return axis.IsConstant() ? ConstantHeight : usual; }

    // How far apart keys are on average, and what of them there is room for.
    struct Spacing {
        double pixels;
        bool showKeys;
        bool showHandles;
    };
    Spacing SpacingOf(StreamCurves const& curves, double pixelsPerSecond) const
    {
        auto const& keys = curves.components.front().keys;
        double const extent = keys.empty() ? 0.0 : (keys.back().x - keys.front().x) * pixelsPerSecond;
        double const pixels = keys.size() < 2 ? Right - Left : extent / static_cast<double>(keys.size() - 1);
        bool const fits = pixels >= LeastKeyDistance && keys.size() <= marksOfCurve_;
        return {pixels, fits, fits && pixels >= LeastHandleDistance && keys.size() * 5 <= marksOfCurve_};
    }

    Range const& Drawable(StreamItem const& item, Range const& range) const
    {
        if (!std::isfinite(range.high - range.low))
            throw UserError(options_.selection.ShownFile() + ": " + item.path, "the numbers are too large to draw");
        return range;
    }

    Range Extent(StreamItem const& item, StreamCurves const& curves) const
    {
        Range range{HUGE_VAL, -HUGE_VAL};
        for (ComponentCurve const& curve : curves.components)
            for (Point const& point : curve.value)
                range = {std::min(range.low, point.y), std::max(range.high, point.y)};
        return range.low > range.high ? Range{0.0, 0.0} : Drawable(item, range);
    }

    // Room for the curves, and for the ends of the handles where they are drawn.
    Axis ValueAxis(StreamItem const& item, StreamCurves const& curves, bool withHandles) const
    {
        Range range = Extent(item, curves);
        for (Handle const& handle : curves.handles)
            if (withHandles) range = {std::min(range.low, handle.end.y), std::max(range.high, handle.end.y)};
        double const size = std::max(std::abs(range.low), std::abs(range.high));
        if (range.high - range.low <= size * ConstantShare) return Axis::Around((range.low + range.high) / 2);
        range = WithAir(range, 0.07, size * LeastShare);
        return {range.low, range.high, 9};
    }

    // Speed 0 is always in sight: it is where things rest. `peak`: out, the greatest of those that aren't.
    Axis SpeedAxis(StreamItem const& item, StreamCurves const& curves, Axis const& values, Axis const& time,
                   double* peak) const
    {
        Range range{0.0, 0.0};
        for (ComponentCurve const& curve : curves.components) {
            Range const own = RatesInSight(curve.speed);
            range = {std::min(range.low, own.low), std::max(range.high, own.high)};
        }
        for (ComponentCurve const& curve : curves.components)
            for (Point const& point : curve.speed)
                if (point.y < range.low || point.y > range.high) *peak = std::max(*peak, std::abs(point.y));
        double const seconds = (time.High() - time.Low()) / unit_.perSecond;
        double const drift = (values.High() - values.Low()) / seconds;
        if (values.IsConstant() || std::max(-range.low, range.high) <= drift * 1e-3) return Axis::Around(0.0);
        range = WithAir(Drawable(item, range), 0.07, drift / 100);
        return {range.low, range.high, 6};
    }

    Point Place(Panel const& panel, Point const& point) const
    {
        return {panel.X(point.x * unit_.perSecond), panel.Y(point.y)};
    }

    // What is too close in a graph to be seen apart, in its units.
    static double Tolerance(Panel const& panel) { return LeastDistance / std::abs(panel.Y(1.0) - panel.Y(0.0)); }

    // A pen that tells a component from those before it also where their curves are one, or nearly so.
    static Pen CurvePen(Drawn const& drawn, StreamCurves const& curves, std::size_t d, CurvePoints points,
                        double tolerance)
    {
        std::size_t const covered = CountAlike(curves, d, points, tolerance);
        std::string_view const dashes = covered == 0 ? Dashes[drawn.components[d] / Colors.size() % Dashes.size()]
                                                     : OverlapDashes[std::min(covered, OverlapDashes.size()) - 1];
        return {drawn.Color(d), 2.0, dashes};
    }

    void DrawCurves(Panel const& panel, Drawn const& drawn, StreamCurves const& curves, CurvePoints points)
    {
        for (std::size_t d = 0; d < curves.components.size(); ++d) {
            std::vector<Point> placed;
            for (Point const& point : curves.components[d].*points) {
                Point const at = Place(panel, point);
                placed.push_back({at.x, panel.Held(at.y)});
            }
            svg_.Polyline(ThinGraph(std::move(placed), pointsOfCurve_),
                          CurvePen(drawn, curves, d, points, Tolerance(panel)));
        }
    }

    // Fewer marks the closer the keys are, so that the curve stays in sight.
    void DrawKeys(Panel const& panel, Drawn const& drawn, StreamCurves const& curves, Spacing const& spacing)
    {
        for (Handle const& handle : curves.handles) {
            if (spacing.showHandles) {
                std::string_view const color = drawn.Color(handle.component);
                svg_.Line(Place(panel, handle.key), Place(panel, handle.end), {color, 1.2, "", 0.75});
                svg_.Circle(Place(panel, handle.end), 3.5, "#ffffff", {color, 1.4});
                drewHandles_ = true;
            }
        }
        if (curves.components.front().keys.empty()) return;
        if (!spacing.showKeys) DrawBand(panel, curves.components.front().keys);
        (spacing.showKeys ? drewKeys_ : drewBand_) = true;
        double const radius = spacing.showKeys ? std::clamp(spacing.pixels / 5, 2.5, 5.5) : 5.0;
        for (std::size_t d = 0; d < curves.components.size(); ++d) {
            auto const& keys = curves.components[d].keys;
            for (std::size_t i = 0; i < keys.size(); ++i)
                if (spacing.showKeys || i == 0 || i + 1 == keys.size())
                    svg_.Diamond(Place(panel, keys[i]), radius, drawn.Color(d), {"#ffffff", radius / 5});
        }
    }

    // Where there are keys, along the bottom.
    void DrawBand(Panel const& panel, std::vector<Point> const& keys)
    {
        constexpr double widestGap = 6.0;
        double begin = Place(panel, keys.front()).x;
        double end = begin;
        auto const draw = [&] {
            svg_.Rectangle({begin - 0.5, panel.Bottom() - BandHeight}, end - begin + 1, BandHeight, BandColor,
                           {"none"});
        };
        for (Point const& key : keys) {
            double const x = Place(panel, key).x;
            if (x - end > widestGap) {
                draw();
                begin = x;
            }
            end = x;
        }
        draw();
    }

    // Returns its lower end.
    double DrawLegend(Drawn const& drawn, StreamCurves const& curves, Panel const& panel)
    {
        double y = panel.Box().top + 12;
        CurvePoints const values = &ComponentCurve::value;
        for (std::size_t d = 0; d < drawn.components.size(); ++d) {
            std::size_t const same = FirstAlike(curves, d, values, 0.0);
            std::size_t const close = FirstAlike(curves, d, values, Tolerance(panel));
            std::string const note = same != d    ? " = " + drawn.Name(same)
                                     : close != d ? " \u2248 " + drawn.Name(close)
                                                  : "";
            svg_.Line({Right + 22, y}, {Right + 54, y},
                      {drawn.Color(d), 3.0, Dashes[drawn.components[d] / Colors.size() % Dashes.size()]});
            svg_.Text({Right + 64, y + 4.5}, drawn.Name(d) + note, {14.0, "#222222"});
            y += 22;
        }
        if (drawn.left > 0) {
            svg_.Text({Right + 22, y + 4.5}, fmt::format("and {} more; --components", drawn.left), {13.0, "#666666"});
            svg_.Text({Right + 22, y + 22}, "chooses others", {13.0, "#666666"});
        }
        return y + 30;
    }

    DrawingOptions const& options_;
    TimeUnit unit_;
    std::vector<StreamItem const*> shown_;
    std::vector<Drawn> drawn_;
    std::size_t pointsOfCurve_ = 0;
    std::size_t marksOfCurve_ = 0;
    Svg svg_;
    bool drewKeys_ = false;
    bool drewBand_ = false;
    bool drewHandles_ = false;
};

}  // namespace

std::vector<StreamItem const*> StreamsToDraw(DrawingOptions const& options, kfshost::Scene const& scene, bool pathsOnly)
{
    std::string const file = options.selection.ShownFile();
    auto items = SelectStreams(scene, options.selection);
    std::erase_if(items, [pathsOnly](StreamItem const* item) {
        return !kfshost::HasKeys(*item->stream) || !SpanOf({item}) || (pathsOnly && !item->stream->IsSpatial());
    });
    if (items.empty()) throw UserError(file, "the chosen streams have no keys to draw");
    std::erase_if(items, [&options](StreamItem const* item) {
        TimeSpan const part = options.Cut(*SpanOf({item}));
        return part.last < part.first;
    });
    if (items.empty())
        throw UserError(file, "--from, --to: none of the chosen streams has keys on both sides of a time there");
    for (std::string const& name : options.components)
        if (std::ranges::none_of(items,
                                 [&](StreamItem const* item) { return !ChosenComponents(*item, {name}).empty(); }))
            throw UserError(file, "--components: none of the chosen streams has a component " + name);
    std::erase_if(items,
                  [&options](StreamItem const* item) { return ChosenComponents(*item, options.components).empty(); });
    return items;
}

std::string DrawValues(DrawingOptions const& options, kfshost::Scene const& scene)
{
    return Plot(options, scene, StreamsToDraw(options, scene, false)).Draw();
}
