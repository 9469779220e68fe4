#pragma once

#include "cli/selection.h"

#include <optional>
#include <string>
#include <vector>

struct DrawingOptions {
    Selection selection;
    kfshost::Rational fps;
    bool inFrames = false;
    std::optional<kfshost::Rational> from;  // else the first key
    std::optional<kfshost::Rational> to;    // else the last key
    std::vector<std::string> components;    // of curves; empty: all

    // The part of a span that is to be drawn; where they don't meet, its last is before its first.
    TimeSpan Cut(TimeSpan const& span) const
    {
        return {from ? std::max(*from, span.first) : span.first, to ? std::min(*to, span.last) : span.last};
    }
};

// Drawings of the selected streams of a scene, as SVG of some 2 MB at most however many keys there are. They throw
// UserError and kfshost::StoreError.

// Value and speed over time.
std::string DrawValues(DrawingOptions const& options, kfshost::Scene const& scene);
// Routes in space over their speed, of positions held as paths.
std::string DrawMotions(DrawingOptions const& options, kfshost::Scene const& scene);

// The selected streams of which there is something to draw. Throws UserError where there is none.
std::vector<kfshost::StreamItem const*> StreamsToDraw(DrawingOptions const& options, kfshost::Scene const& scene,
                                                      bool pathsOnly);
