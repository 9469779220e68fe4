#pragma once

#include "cli/svg.h"

#include <cstddef>
#include <vector>

// Lines with no more points than a drawing can show. Both keep the first and the last point, and what is short enough
// already stays as it is.

// Of a line whose points go from left to right: in each of as many columns as `most` points allow it keeps where the line
// comes in, its lowest, its highest, and where it goes out, so that no peak is lost.
std::vector<Point> ThinGraph(std::vector<Point> points, std::size_t most);
// Of a line that goes anywhere: drops points that are close to the last one kept, the closer `most` is to be met.
std::vector<Point> ThinRoute(std::vector<Point> points, std::size_t most);
