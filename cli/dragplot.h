#pragma once

#include "cli/curvesamples.h"

#include <string>
#include <vector>

// What a drag has done to a stream.
struct DragPicture {
    std::string path;  // of the stream
    std::vector<std::string> components;
    StreamCurves before;
    StreamCurves after;
    double seconds = 0.0;         // where it was dragged
    std::vector<double> target;   // a value for each component
    std::vector<bool> isDragged;  // each component
    bool isRoute = false;         // the two components are the coordinates of a path
};

// Draws it into one SVG: the curves before in grey, and after in colour with their handles, and the targets. Throws
// UserError where the numbers are too large.
std::string DrawDrag(DragPicture const& picture);
