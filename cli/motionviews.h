#pragma once

#include "cli/motionsamples.h"
#include "cli/panel.h"

#include <memory>
#include <string_view>
#include <vector>

// A side that a motion is seen from: which of x, y and z goes to the right, and which up, or down the drawing.
struct MotionView {
    std::string_view caption;
    std::size_t right;
    std::size_t up;
    bool downward;

    Point Project(Place const& place) const { return {place[right], place[up]}; }
};

// A view with its place in the drawing.
struct PlacedView {
    MotionView view;
    std::unique_ptr<Axis const> horizontal;
    std::unique_ptr<Axis const> vertical;
    std::unique_ptr<Panel const> panel;

    Point At(Place const& place) const
    {
        Point const point = view.Project(place);
        return {panel->X(point.x), panel->Y(point.y)};
    }
};

struct MotionLayout {
    std::vector<PlacedView> views;
    double unitsPerPixel;  // of all views, in both directions
    double height;         // with the labels below
};

// Where a motion goes: the box around all that is to be seen of it.
struct Extents {
    Place low;
    Place high;
};

// The view that shows most, or three where the motion makes notable use of all of space: from the front, beside it from
// the side and below it from above, each the way it is folded over. `top` is where captions begin. Throws UserError, with
// the motion's name, for numbers that are too large.
MotionLayout LayOutViews(Extents const& extents, double top, std::string const& name);
