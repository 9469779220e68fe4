#include "cli/dragplot.h"

#include "cli/axis.h"
#include "cli/panel.h"
#include "cli/thin.h"
#include "cli/usererror.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace {

constexpr double GraphHeight = 460.0;
constexpr double RouteHeight = 760.0;
constexpr double Top = 110.0;
constexpr double BelowGraph = 62.0;
constexpr std::size_t MostPoints = 5000;

constexpr std::array<std::string_view, 4> Colors{"#d1432b", "#17915f", "#1f6fb5", "#c07a00"};
constexpr std::string_view BeforeColor = "#9aa0a6";

std::string_view ColorOf(std::size_t component)
{
    return Colors[component % Colors.size()];
}

// Lines and marks that share a panel.
struct Layer {
    std::vector<std::vector<Point>> lines;
    std::vector<std::vector<Point>> keys;
    std::vector<Handle> handles;
};

// Of a path the way that it takes, else the value over time of each dragged component.
Layer MakeLayer(DragPicture const& picture, StreamCurves const& curves)
{
    Layer layer;
    auto const zip = [&](std::vector<Point> ComponentCurve::*points) {
        std::vector<Point> const& x = curves.components[0].*points;
        std::vector<Point> const& y = curves.components[1].*points;
        std::vector<Point> route;
        for (std::size_t i = 0; i < std::min(x.size(), y.size()); ++i) route.push_back({x[i].y, y[i].y});
        return route;
    };
    if (picture.isRoute) {
        layer.lines.push_back(zip(&ComponentCurve::value));
        layer.keys.push_back(zip(&ComponentCurve::keys));
        return layer;
    }
    for (std::size_t c = 0; c < curves.components.size(); ++c) {
        layer.lines.push_back(picture.isDragged[c] ? curves.components[c].value : std::vector<Point>());
        layer.keys.push_back(picture.isDragged[c] ? curves.components[c].keys : std::vector<Point>());
    }
    for (Handle const& handle : curves.handles)
        if (picture.isDragged[handle.component]) layer.handles.push_back(handle);
    return layer;
}

std::vector<Point> TargetsOf(DragPicture const& picture)
{
    if (picture.isRoute) return {{picture.target[0], picture.target[1]}};
    std::vector<Point> targets;
    for (std::size_t c = 0; c < picture.target.size(); ++c)
        if (picture.isDragged[c]) targets.push_back({picture.seconds, picture.target[c]});
    return targets;
}

struct Extent {
    Range x{HUGE_VAL, -HUGE_VAL};
    Range y{HUGE_VAL, -HUGE_VAL};

    void Include(Point const& point)
    {
        x = {std::min(x.low, point.x), std::max(x.high, point.x)};
        y = {std::min(y.low, point.y), std::max(y.high, point.y)};
    }
    void Include(Layer const& layer)
    {
        for (std::vector<Point> const& line : layer.lines)
            for (Point const& point : line) Include(point);
        for (Handle const& handle : layer.handles) Include(handle.end);
    }
};

double SizeOf(Range const& range)
{
    return std::max({std::abs(range.low), std::abs(range.high), 1e-9});
}

// A route isn't stretched: the smaller extent gets as much room a unit as the larger one.
void KeepShape(Extent& extent, double width, double height)
{
    double const unit = std::max((extent.x.high - extent.x.low) / width, (extent.y.high - extent.y.low) / height);
    for (auto [range, pixels] : {std::pair{&extent.x, width}, std::pair{&extent.y, height}}) {
        double const air = (unit * pixels - (range->high - range->low)) / 2;
        *range = {range->low - air, range->high + air};
    }
}

void DrawLayer(Svg& svg, Panel const& panel, Layer const& layer, bool isBefore)
{
    auto const place = [&](Point const& point) { return Point{panel.X(point.x), panel.Y(point.y)}; };
    auto const color = [&](std::size_t component) { return isBefore ? BeforeColor : ColorOf(component); };
    for (std::size_t c = 0; c < layer.lines.size(); ++c) {
        std::vector<Point> placed;
        for (Point const& point : layer.lines[c]) placed.push_back(place(point));
        svg.Polyline(ThinRoute(std::move(placed), MostPoints), {color(c), 2.0, isBefore ? "7 5" : ""});
    }
    for (Handle const& handle : layer.handles) {
        svg.Line(place(handle.key), place(handle.end), {color(handle.component), 1.2, "", 0.75});
        svg.Circle(place(handle.end), 3.5, "#ffffff", {color(handle.component), 1.4});
    }
    if (isBefore) return;  // the keys stay where they are
    for (std::size_t c = 0; c < layer.keys.size(); ++c)
        for (Point const& key : layer.keys[c]) svg.Diamond(place(key), 5.0, color(c), {"#ffffff", 1.0});
}

void DrawHeader(Svg& svg, DragPicture const& picture)
{
    svg.Text({PanelLeft, 38}, ShortenedPath(picture.path), {20.0, "#111111", Anchor::Start, true});
    double x = PanelLeft;
    auto const entry = [&](std::string const& text, std::string_view color, std::string_view dashes) {
        svg.Line({x, 62}, {x + 34, 62}, {color, 2.0, dashes});
        svg.Text({x + 42, 66.5}, text, {14.0, "#222222"});
        x += 62 + 8.5 * static_cast<double>(text.size());
    };
    entry("before", BeforeColor, "7 5");
    if (picture.isRoute) entry("after", ColorOf(0), "");
    for (std::size_t c = 0; c < picture.components.size() && !picture.isRoute; ++c)
        if (picture.isDragged[c]) entry(picture.components[c] + " after", ColorOf(c), "");
    svg.Circle({x + 17, 62}, 8.0, "none", {"#111111", 1.6});
    svg.Text({x + 34, 66.5}, "target", {14.0, "#222222"});
}

}  // namespace

std::string DrawDrag(DragPicture const& picture)
{
    Layer const before = MakeLayer(picture, picture.before);
    Layer const after = MakeLayer(picture, picture.after);
    std::vector<Point> const targets = TargetsOf(picture);
    Extent extent;
    extent.Include(before);
    extent.Include(after);
    for (Point const& target : targets) extent.Include(target);
    if (!std::isfinite(extent.y.high - extent.y.low) || !std::isfinite(extent.x.high - extent.x.low))
        throw UserError(picture.path, "the numbers are too large to draw");

    double const width = PanelRight - PanelLeft;
    double const height = picture.isRoute ? RouteHeight : GraphHeight;
    extent.y = WithAir(extent.y, 0.07, SizeOf(extent.y) * 1e-4);
    if (picture.isRoute) {
        extent.x = WithAir(extent.x, 0.07, SizeOf(extent.x) * 1e-4);
        KeepShape(extent, width, height);
    }
    Axis const horizontal(extent.x.low, extent.x.high, 12);
    Axis const vertical(extent.y.low, extent.y.high, 9);
    Panel const panel({PanelLeft, Top, width, height}, horizontal, vertical);
    Svg svg;
    DrawHeader(svg, picture);
    panel.DrawFrame(svg, picture.isRoute ? picture.components[1] + " over " + picture.components[0] : "value");
    DrawLayer(svg, panel, before, true);
    DrawLayer(svg, panel, after, false);
    for (Point const& target : targets)
        svg.Circle({panel.X(target.x), panel.Y(target.y)}, 8.0, "none", {"#111111", 1.6});
    panel.DrawLabelsBelow(svg, picture.isRoute ? picture.components[0] : "seconds");
    return svg.Finish(DrawingWidth, panel.Bottom() + BelowGraph);
}
