#pragma once

#include "cli/axis.h"
#include "cli/drawing.h"
#include "cli/svg.h"

#include <algorithm>
#include <string>

// The frame that all drawings share: graphs between the two, labels to their left, legends to their right.
inline constexpr double DrawingWidth = 1600.0;
inline constexpr double PanelLeft = 110.0;
inline constexpr double PanelRight = 1360.0;

// A time axis in seconds, or in frames.
struct TimeUnit {
    std::string name;
    double perSecond;
    double leastStep;
};
TimeUnit MakeTimeUnit(DrawingOptions const& options);
// Each animation has a time axis of its own, for those of its streams that are drawn, or for the part of it that is
// asked for.
Axis MakeTimeAxis(DrawingOptions const& options, std::vector<kfshost::StreamItem const*> const& drawn,
                  std::string const& animation);

// The end of a path that is too long for a title.
std::string ShortenedPath(std::string const& path);

// What a caption says of numbers that go off the panel, of which `peak` is the greatest; nothing where none do.
std::string PeakNote(double peak);

struct PanelBox {
    double left;
    double top;
    double width;
    double height;
};

// One graph: maps what it shows to the drawing. The axes must outlive it.
class Panel {
public:
    // `downward`: numbers grow towards the bottom.
    Panel(PanelBox const& box, Axis const& horizontal, Axis const& vertical, bool downward = false);

    PanelBox const& Box() const { return box_; }
    double Bottom() const { return box_.top + box_.height; }
    double X(double number) const;
    double Y(double number) const;
    // A height as it is inside the panel, at its edge where it would be beyond.
    double Held(double y) const { return std::clamp(y, box_.top, Bottom()); }

    // The ground with its grid, the numbers at its left, and a caption above.
    void DrawFrame(Svg& svg, std::string const& caption) const;
    void DrawLabelsBelow(Svg& svg, std::string const& unit) const;

private:
    PanelBox box_;
    Axis const& horizontal_;
    Axis const& vertical_;
    bool downward_;
};
