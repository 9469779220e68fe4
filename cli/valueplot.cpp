#include "cli/axis.h"
#include "cli/curvesamples.h"
#include "cli/drawing.h"
#include "cli/panel.h"
#include "cli/usererror.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <cmath>

using kfshost::StreamItem;

namespace {

constexpr std::size_t MostStreams = 6;
constexpr std::size_t MostLegendLines = 14;

constexpr double Left = PanelLeft;
constexpr double Right = PanelRight;
constexpr double HeaderHeight = 76.0;
constexpr double TitleHeight = 40.0;
constexpr double ValueHeight = 300.0;
constexpr double PanelGap = 30.0;
constexpr double SpeedHeight = 150.0;
constexpr double AxisHeight = 62.0;
constexpr double StreamHeight = TitleHeight + ValueHeight + PanelGap + SpeedHeight + AxisHeight;

// Told apart in print and by eyes that don't tell red from green; x, y and z come near their usual red, green and blue.
constexpr std::array<std::string_view, 8> Colors{"#d1432b", "#17915f", "#1f6fb5", "#c07a00",
                                                 "#8a4fa8", "#3a3a3a", "#2aa7c9", "#b0397e"};
constexpr std::array<std::string_view, 3> Dashes{"", "9 4", "2 4"};
// For a curve on top of one, two or more others: their colours show in the gaps.
constexpr std::array<std::string_view, 3> OverlapDashes{"14 14", "14 28", "14 42"};

// A graph isn't blown up to show less than this share of its numbers: below lies the noise of 32-bit floats.
constexpr double LeastShare = 1e-4;

using CurvePoints = std::vector<Point> ComponentCurve::*;

bool Coincide(std::vector<Point> const& a, std::vector<Point> const& b)
{
    return std::ranges::equal(
        a, b, [](Point const& p, Point const& q) { return p.x == q.x && p.y == q.y; });
}

// The first component whose curve is the same as that of `component`, which may be itself.
std::size_t FirstAlike(StreamCurves const& curves, std::size_t component, CurvePoints points)
{
    std::size_t d = 0;
    while (!Coincide(curves.components[d].*points, curves.components[component].*points)) ++d;
    return d;
}

// How often a curve was drawn already before that of `component` comes.
std::size_t CountAlike(StreamCurves const& curves, std::size_t component, CurvePoints points)
{
    std::size_t count = 0;
    for (std::size_t d = 0; d < component; ++d)
        count += Coincide(curves.components[d].*points, curves.components[component].*points) ? 1 : 0;
    return count;
}

// Components that belong to an axis have its colour wherever they stand; others have one by their place.
std::string_view ColorOf(StreamItem const& item, std::size_t component)
{
    char const letter = item.components[component].front();
    std::size_t const axis = std::string_view("XYZ").find(letter);
    return Colors[axis == std::string_view::npos ? component % Colors.size() : axis];
}

class Plot {
public:
    Plot(DrawingOptions const& options, kfshost::Scene const& scene, std::vector<StreamItem const*> const& all)
        : unit_(MakeTimeUnit(options)),
          shown_(all.begin(), all.begin() + static_cast<std::ptrdiff_t>(std::min(all.size(), MostStreams))),
          time_(MakeTimeAxis(unit_, shown_))
    {
        DrawHeader(scene.name, all.size());
    }

    std::string Draw()
    {
        double top = HeaderHeight;
        for (StreamItem const* item : shown_) {
            DrawStream(*item, top);
            top += StreamHeight;
        }
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

    // What the marks mean that are there, and why there are none.
    void DrawMarkLegend()
    {
        double const y = 33;
        if (drewKeys_) {
            svg_.Diamond({Right - 170, y}, 5.5, "#555555", {"#ffffff", 1.2});
            svg_.Text({Right - 158, y + 4.5}, "key", {13.0, "#444444"});
        } else {
            svg_.Text({Right, y + 4.5}, "keys stand too close to be drawn", {13.0, "#666666", Anchor::End});
        }
        if (drewHandles_) {
            svg_.Line({Right - 100, y}, {Right - 66, y}, {"#555555", 1.2});
            svg_.Circle({Right - 66, y}, 3.5, "#ffffff", {"#555555", 1.4});
            svg_.Text({Right - 54, y + 4.5}, "handle", {13.0, "#444444"});
        }
    }

    void DrawStream(StreamItem const& item, double top)
    {
        svg_.Text({Left, top + 14}, ShortenedPath(item.path), {15.0, "#111111", Anchor::Start, true});
        double const valueTop = top + TitleHeight;
        double const pointsPerUnit = (Right - Left) / (time_.High() - time_.Low());
        StreamCurves const curves = SampleCurves(item, pointsPerUnit * unit_.perSecond);
        bool const showHandles = PixelsPerKey(curves) >= 14.0;

        Axis const values = ValueAxis(curves, showHandles);
        Panel const valuePanel({Left, valueTop, Right - Left, ValueHeight}, time_, values);
        valuePanel.DrawFrame(
            svg_, std::string(NameOf(item.kind)) + (item.kind == kfshost::StreamKind::Angles ? " in degrees, " : ", ") +
                      std::string(NameOf(item.interpolation)) + (item.stream->IsSpatial() ? " along a path" : ""));
        DrawCurves(valuePanel, item, curves, &ComponentCurve::value);
        DrawKeys(valuePanel, item, curves, showHandles);
        DrawLegend(item, curves, valueTop);

        Axis const speeds = SpeedAxis(curves, values);
        Panel const speedPanel({Left, valuePanel.Bottom() + PanelGap, Right - Left, SpeedHeight}, time_, speeds);
        speedPanel.DrawFrame(svg_, item.kind == kfshost::StreamKind::Angles ? "speed, degrees a second"
                                                                            : "speed, units a second");
        DrawCurves(speedPanel, item, curves, &ComponentCurve::speed);
        speedPanel.DrawLabelsBelow(svg_, unit_.name);
    }

    // How far apart keys are on average.
    double PixelsPerKey(StreamCurves const& curves) const
    {
        auto const& keys = curves.components.front().keys;
        double const extent =
            (keys.back().x - keys.front().x) * unit_.perSecond / (time_.High() - time_.Low()) * (Right - Left);
        return keys.size() < 2 ? Right - Left : extent / static_cast<double>(keys.size() - 1);
    }

    static Range Extent(StreamCurves const& curves, CurvePoints points)
    {
        Range range{HUGE_VAL, -HUGE_VAL};
        for (ComponentCurve const& curve : curves.components)
            for (Point const& point : curve.*points)
                range = {std::min(range.low, point.y), std::max(range.high, point.y)};
        if (range.low > range.high) return {0.0, 0.0};
        if (!std::isfinite(range.high - range.low)) throw UserError("plot", "the numbers are too large to draw");
        return range;
    }

    // Room for the curves, and for the ends of the handles where they are drawn.
    static Axis ValueAxis(StreamCurves const& curves, bool withHandles)
    {
        Range range = Extent(curves, &ComponentCurve::value);
        for (Handle const& handle : curves.handles)
            if (withHandles) range = {std::min(range.low, handle.end.y), std::max(range.high, handle.end.y)};
        double const size = std::max(std::abs(range.low), std::abs(range.high));
        range = WithAir(range, 0.07, size == 0.0 ? 1.0 : size * LeastShare);
        return {range.low, range.high, 9};
    }

    // Speed 0 is always in sight: it is where things rest.
    Axis SpeedAxis(StreamCurves const& curves, Axis const& values) const
    {
        Range range = Extent(curves, &ComponentCurve::speed);
        double const seconds = (time_.High() - time_.Low()) / unit_.perSecond;
        double const drift = (values.High() - values.Low()) / seconds;
        range = WithAir({std::min(range.low, 0.0), std::max(range.high, 0.0)}, 0.07, drift / 100);
        return {range.low, range.high, 6};
    }

    Point Place(Panel const& panel, Point const& point) const
    {
        return {panel.X(point.x * unit_.perSecond), panel.Y(point.y)};
    }

    // A pen that tells a component from those before it also where their curves are one.
    static Pen CurvePen(StreamItem const& item, StreamCurves const& curves, std::size_t component, CurvePoints points)
    {
        std::size_t const covered = CountAlike(curves, component, points);
        std::string_view const dashes = covered == 0 ? Dashes[component / Colors.size() % Dashes.size()]
                                                     : OverlapDashes[std::min(covered, OverlapDashes.size()) - 1];
        return {ColorOf(item, component), 2.0, dashes};
    }

    void DrawCurves(Panel const& panel, StreamItem const& item, StreamCurves const& curves, CurvePoints points)
    {
        std::vector<Point> placed;
        for (std::size_t d = 0; d < curves.components.size(); ++d) {
            placed.clear();
            for (Point const& point : curves.components[d].*points) placed.push_back(Place(panel, point));
            svg_.Polyline(placed, CurvePen(item, curves, d, points));
        }
    }

    // Fewer marks the closer the keys are, so that the curve stays in sight.
    void DrawKeys(Panel const& panel, StreamItem const& item, StreamCurves const& curves, bool showHandles)
    {
        for (Handle const& handle : curves.handles) {
            if (showHandles) {
                std::string_view const color = ColorOf(item, handle.component);
                svg_.Line(Place(panel, handle.key), Place(panel, handle.end), {color, 1.2, "", 0.75});
                svg_.Circle(Place(panel, handle.end), 3.5, "#ffffff", {color, 1.4});
                drewHandles_ = true;
            }
        }
        double const spacing = PixelsPerKey(curves);
        if (spacing < 4.0) return;
        drewKeys_ = true;
        double const radius = std::clamp(spacing / 5, 2.5, 5.5);
        for (std::size_t d = 0; d < curves.components.size(); ++d)
            for (Point const& key : curves.components[d].keys)
                svg_.Diamond(Place(panel, key), radius, ColorOf(item, d), {"#ffffff", radius / 5});
    }

    void DrawLegend(StreamItem const& item, StreamCurves const& curves, double top)
    {
        double y = top + 12;
        for (std::size_t d = 0; d < item.components.size(); ++d) {
            if (d == MostLegendLines) {
                svg_.Text({Right + 22, y + 4.5}, fmt::format("and {} more", item.components.size() - d),
                          {13.0, "#666666"});
                return;
            }
            std::size_t const alike = FirstAlike(curves, d, &ComponentCurve::value);
            std::string const note = alike == d ? "" : " = " + item.components[alike];
            svg_.Line({Right + 22, y}, {Right + 54, y},
                      {ColorOf(item, d), 3.0, Dashes[d / Colors.size() % Dashes.size()]});
            svg_.Text({Right + 64, y + 4.5}, item.components[d] + note, {14.0, "#222222"});
            y += 22;
        }
    }

    TimeUnit unit_;
    std::vector<StreamItem const*> shown_;
    Svg svg_;
    Axis time_;
    bool drewKeys_ = false;
    bool drewHandles_ = false;
};

}  // namespace

std::string DrawValues(DrawingOptions const& options, kfshost::Scene const& scene)
{
    auto items = SelectStreams(scene, options.selection);
    std::erase_if(items, [](StreamItem const* item) { return kfshost::KeyCount(*item->stream) == 0; });
    if (items.empty()) throw UserError(options.selection.file, "the chosen streams have no keys to draw");
    return Plot(options, scene, items).Draw();
}
