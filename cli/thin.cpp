#include "cli/thin.h"

#include <algorithm>
#include <cmath>

namespace {

// The points of one column that say all about it, in their order.
void AddColumn(std::vector<Point>& thin, Point const* begin, Point const* end)
{
    auto const byHeight = [](Point const& a, Point const& b) { return a.y < b.y; };
    auto const [low, high] = std::minmax_element(begin, end, byHeight);
    Point const* kept[] = {begin, std::min(low, high), std::max(low, high), end - 1};
    for (std::size_t i = 0; i < 4; ++i)
        if (i == 0 || kept[i] != kept[i - 1]) thin.push_back(*kept[i]);
}

std::vector<Point> WithoutCloseOnes(std::vector<Point> const& points, double distance)
{
    std::vector<Point> thin{points.front()};
    for (Point const& point : points)
        if (std::hypot(point.x - thin.back().x, point.y - thin.back().y) >= distance) thin.push_back(point);
    thin.push_back(points.back());
    return thin;
}

}  // namespace

std::vector<Point> ThinGraph(std::vector<Point> points, std::size_t most)
{
    std::size_t const columns = std::max<std::size_t>(most / 4, 1);
    if (points.size() <= most) return points;
    double const left = points.front().x;
    double const width = (points.back().x - left) / static_cast<double>(columns);
    std::vector<Point> thin;
    Point const* const end = points.data() + points.size();
    for (Point const* begin = points.data(); begin != end;) {
        double const right = begin->x + width;
        Point const* const next = std::find_if(begin + 1, end, [right](Point const& point) { return point.x > right; });
        AddColumn(thin, begin, next);
        begin = next;
    }
    return thin;
}

std::vector<Point> ThinRoute(std::vector<Point> points, std::size_t most)
{
    for (double distance = 0.25; points.size() > most; distance *= 1.5) points = WithoutCloseOnes(points, distance);
    return points;
}
