#pragma once

#include "cli/selection.h"

#include <string>

struct DrawingOptions {
    Selection selection;
    kfshost::Rational fps;
    bool inFrames = false;
};

// Drawings of the selected streams of a scene, as SVG. They throw UserError and kfshost::StoreError.

// Value and speed over time.
std::string DrawValues(DrawingOptions const& options, kfshost::Scene const& scene);
// Routes in space over their speed, of positions held as paths.
std::string DrawMotions(DrawingOptions const& options, kfshost::Scene const& scene);
