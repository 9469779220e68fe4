#include "cli/labels.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double WidthOfLetter = 0.62;  // on average, of the font's size
constexpr double Stride = 3.0;          // between the points that stand for a line

}  // namespace

void Labels::AvoidLine(std::span<Point const> line)
{
    for (std::size_t i = 1; i < line.size(); ++i) {
        Point const from = line[i - 1];
        Point const way{line[i].x - from.x, line[i].y - from.y};
        int const steps = static_cast<int>(std::clamp(std::hypot(way.x, way.y) / Stride, 1.0, 1000.0));
        for (int k = 0; k <= steps; ++k) avoided_.push_back({from.x + way.x * k / steps, from.y + way.y * k / steps});
    }
}

Point Labels::Place(Point mark, double radius, std::string_view text)
{
    double const width = static_cast<double>(text.size()) * fontSize_ * WidthOfLetter;
    double const height = fontSize_;
    Box best{};
    double lowest = HUGE_VAL;
    // Close by first, and below and above before beside: equal costs leave the first.
    for (double const distance : {4.0, 12.0, 24.0}) {
        double const right = radius + distance + width / 2;
        double const down = radius + distance + height / 2;
        Point const offsets[] = {{0, down},     {0, -down},     {right, 0},     {-right, 0},
                                 {right, down}, {-right, down}, {right, -down}, {-right, -down}};
        for (Point const& offset : offsets) {
            Point const middle{mark.x + offset.x, mark.y + offset.y};
            Box const box{middle.x - width / 2, middle.y - height / 2, middle.x + width / 2, middle.y + height / 2};
            double const cost = CostOf(box) + distance / 8;
            if (cost < lowest) {
                lowest = cost;
                best = box;
            }
        }
    }
    taken_.push_back(best);
    return {(best.left + best.right) / 2, best.bottom - height * 0.15};
}

double Labels::CostOf(Box const& box) const
{
    double cost = 0.0;
    for (Point const& point : avoided_)
        if (point.x > box.left - 2 && point.x < box.right + 2 && point.y > box.top - 2 && point.y < box.bottom + 2)
            cost += 1.0;
    for (Box const& other : taken_)
        if (box.left < other.right && other.left < box.right && box.top < other.bottom && other.top < box.bottom)
            cost += 50.0;
    bool const isInside = box.left > room_.left && box.right < room_.left + room_.width && box.top > room_.top &&
                          box.bottom < room_.top + room_.height;
    return isInside ? cost : cost + 200.0;
}
