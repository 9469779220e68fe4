#include "cli/panel.h"

#include <fmt/format.h>

using kfshost::StreamItem;

namespace {

std::string WithFactor(std::string const& text, Axis const& axis)
{
    return axis.Factor().empty() ? text : text + ", times " + axis.Factor();
}

}  // namespace

TimeUnit MakeTimeUnit(DrawingOptions const& options)
{
    if (!options.inFrames) return {"seconds", 1.0, 0.0};
    return {"frames at " + options.fps.ToString() + " a second", options.fps.ToDouble(), 1.0};
}

Axis MakeTimeAxis(DrawingOptions const& options, std::vector<StreamItem const*> const& drawn,
                  std::string const& animation)
{
    std::vector<StreamItem const*> items;
    for (StreamItem const* item : drawn)
        if (item->animation == animation) items.push_back(item);
    TimeUnit const unit = MakeTimeUnit(options);
    auto const span = options.Cut(SpanOf(items).value_or(TimeSpan{}));
    Range const keys{span.first.ToDouble() * unit.perSecond, span.last.ToDouble() * unit.perSecond};
    Range const range = WithAir(keys, 0.02, keys.low == keys.high ? unit.perSecond : 1e-9);
    return {range.low, range.high, 12, unit.leastStep};
}

std::string ShortenedPath(std::string const& path)
{
    constexpr std::size_t most = 110;
    if (path.size() <= most) return path;
    std::size_t start = path.size() - most;
    while ((static_cast<unsigned char>(path[start]) & 0xC0) == 0x80) ++start;
    return "..." + path.substr(start);
}

std::string PeakNote(double peak)
{
    return peak == 0.0 ? "" : fmt::format(", off the panel up to {:.3g}", peak);
}

Panel::Panel(PanelBox const& box, Axis const& horizontal, Axis const& vertical, bool downward)
    : box_(box),
      horizontal_(horizontal),
      vertical_(vertical),
      downward_(downward)
{}

double Panel::X(double number) const
{
    return box_.left + (number - horizontal_.Low()) / (horizontal_.High() - horizontal_.Low()) * box_.width;
}

double Panel::Y(double number) const
{
    double const share = (number - vertical_.Low()) / (vertical_.High() - vertical_.Low());
    return downward_ ? box_.top + share * box_.height : Bottom() - share * box_.height;
}

void Panel::DrawFrame(Svg& svg, std::string const& caption) const
{
    Pen const grid{"#e4e4e4"};
    double const right = box_.left + box_.width;
    svg.Rectangle({box_.left, box_.top}, box_.width, box_.height, "#fcfcfc", {"none"});
    for (double const tick : horizontal_.Ticks()) svg.Line({X(tick), box_.top}, {X(tick), Bottom()}, grid);
    for (double const tick : vertical_.Ticks()) {
        svg.Line({box_.left, Y(tick)}, {right, Y(tick)}, vertical_.IsZero(tick) ? Pen{"#b4b4b4"} : grid);
        svg.Text({box_.left - 10, Y(tick) + 4.5}, vertical_.Label(tick), {13.0, "#444444", Anchor::End});
    }
    svg.Rectangle({box_.left, box_.top}, box_.width, box_.height, "none", {"#8c8c8c"});
    svg.Text({box_.left, box_.top - 8}, WithFactor(caption, vertical_), {13.0, "#666666"});
}

void Panel::DrawLabelsBelow(Svg& svg, std::string const& unit) const
{
    for (double const tick : horizontal_.Ticks()) {
        svg.Line({X(tick), Bottom()}, {X(tick), Bottom() + 5}, {"#8c8c8c"});
        svg.Text({X(tick), Bottom() + 20}, horizontal_.Label(tick), {13.0, "#444444", Anchor::Middle});
    }
    svg.Text({box_.left + box_.width / 2, Bottom() + 40}, WithFactor(unit, horizontal_),
             {13.0, "#666666", Anchor::Middle});
}
