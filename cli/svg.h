#pragma once

#include <span>
#include <string>
#include <string_view>

struct Point {
    double x;
    double y;
};

// How a line is drawn.
struct Pen {
    std::string_view color;
    double width = 1.0;
    std::string_view dashes = "";
    double opacity = 1.0;
};

enum class Anchor { Start, Middle, End };

struct Font {
    double size = 13.0;
    std::string_view color = "#333333";
    Anchor anchor = Anchor::Start;
    bool bold = false;
    bool halo = false;  // a white rim, for text on top of lines
};

// An SVG drawing as it grows.
class Svg {
public:
    void Rectangle(Point corner, double width, double height, std::string_view fill, Pen const& border);
    void Line(Point from, Point to, Pen const& pen);
    // Nothing for fewer than two points.
    void Polyline(std::span<Point const> points, Pen const& pen);
    void Circle(Point center, double radius, std::string_view fill, Pen const& border);
    // Many discs in one element.
    void Dots(std::span<Point const> centers, double radius, std::string_view fill);
    // A square on its corner.
    void Diamond(Point center, double radius, std::string_view fill, Pen const& border);
    // The text stands on the line through `at`.
    void Text(Point at, std::string_view text, Font const& font);

    // The whole drawing, on white.
    std::string Finish(double width, double height) const;

private:
    std::string text_;
};
