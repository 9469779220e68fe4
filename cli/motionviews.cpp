#include "cli/motionviews.h"

#include "cli/usererror.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr MotionView Front{"from the front: x to the right, y up", 0, 1, false};
constexpr MotionView Side{"from the side: z to the right, y up", 2, 1, false};
constexpr MotionView Above{"from above: x to the right, z down", 0, 2, true};

// Below this share of the greatest extent the smallest one says little.
constexpr double NotableShare = 0.2;
// A drawing isn't blown up to show less than this share of its numbers.
constexpr double LeastShare = 1e-4;
// The room that a panel has in proportion to what it shows.
constexpr double Air = 1.2;

constexpr double CaptionHeight = 28.0;
constexpr double LabelHeight = 50.0;
constexpr double Gap = 80.0;
constexpr double MostWidth = PanelRight - PanelLeft;
constexpr double MostHeightOfOne = 620.0;
constexpr double LeastHeightOfOne = 150.0;  // room for the notes of keys on a straight way
constexpr double LeastWidthOfOne = 320.0;
constexpr double MostHeightOfThree = 900.0;
constexpr double TickDistance = 48.0;

// The places of the panels come from the extents; each then shows as much as it has pixels for.
class Layout {
public:
    Layout(Extents const& extents, double top, std::string const& name) : extents_(extents), top_(top + CaptionHeight)
    {
        double size = 0.0;
        for (std::size_t i = 0; i < 3; ++i) {
            size = std::max({size, std::abs(extents.low[i]), std::abs(extents.high[i])});
            extent_[i] = extents.high[i] - extents.low[i];
        }
        least_ = size == 0.0 ? 1.0 : size * LeastShare;
        if (!std::isfinite(size * 4)) throw UserError(name, "the numbers are too large to draw");
    }

    MotionLayout Run()
    {
        // On a tie the front comes first.
        std::size_t const order[] = {2, 0, 1};
        std::size_t const smallest =
            *std::ranges::min_element(order, {}, [this](std::size_t axis) { return extent_[axis]; });
        if (extent_[smallest] <= NotableShare * *std::ranges::max_element(extent_))
            PlaceOne(smallest == 2 ? Front : smallest == 0 ? Side : Above);
        else
            PlaceThree();
        return std::move(layout_);
    }

private:
    void PlaceOne(MotionView const& view)
    {
        double const across = extent_[view.right] * Air;
        double const up = extent_[view.up] * Air;
        double const unitsPerPixel = std::max({across / MostWidth, up / MostHeightOfOne, least_ / MostHeightOfOne});
        layout_.unitsPerPixel = unitsPerPixel;
        double const height = std::clamp(up / unitsPerPixel, LeastHeightOfOne, MostHeightOfOne);
        double const width = std::clamp(across / unitsPerPixel, LeastWidthOfOne, MostWidth);
        Add(view, {PanelLeft, top_, width, height});
        layout_.height = CaptionHeight + height + LabelHeight;
    }

    void PlaceThree()
    {
        double const width = (extent_[0] + extent_[2]) * Air;
        double const height = (extent_[1] + extent_[2]) * Air;
        double const unitsPerPixel =
            std::max({width / (MostWidth - Gap), height / (MostHeightOfThree - Gap), least_ / MostHeightOfThree});
        layout_.unitsPerPixel = unitsPerPixel;
        auto const pixels = [&](std::size_t axis) { return extent_[axis] * Air / unitsPerPixel; };
        Add(Front, {PanelLeft, top_, pixels(0), pixels(1)});
        Add(Side, {PanelLeft + pixels(0) + Gap, top_, pixels(2), pixels(1)});
        Add(Above, {PanelLeft, top_ + pixels(1) + Gap, pixels(0), pixels(2)});
        layout_.height = CaptionHeight + pixels(1) + Gap + pixels(2) + LabelHeight;
    }

    Range Seen(std::size_t axis, double pixels) const
    {
        double const middle = extents_.low[axis] + extent_[axis] / 2;
        double const half = pixels * layout_.unitsPerPixel / 2;
        return {middle - half, middle + half};
    }

    // Both axes have the same step, so that the grid's cells are squares.
    void Add(MotionView const& view, PanelBox const& box)
    {
        Range const across = Seen(view.right, box.width);
        Range const up = Seen(view.up, box.height);
        PlacedView placed{view, nullptr, nullptr, nullptr};
        double const step = Axis(0.0, layout_.unitsPerPixel * TickDistance, 1).Step();
        constexpr int many = 1'000'000;  // the step alone decides
        placed.horizontal = std::make_unique<Axis const>(across.low, across.high, many, step);
        placed.vertical = std::make_unique<Axis const>(up.low, up.high, many, step);
        placed.panel = std::make_unique<Panel const>(box, *placed.horizontal, *placed.vertical, view.downward);
        layout_.views.push_back(std::move(placed));
    }

    Extents extents_;
    double top_;
    Place extent_{};
    double least_ = 0.0;
    MotionLayout layout_{};
};

}  // namespace

MotionLayout LayOutViews(Extents const& extents, double top, std::string const& name)
{
    return Layout(extents, top, name).Run();
}
