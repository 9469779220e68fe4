#include "cli/svg.h"

#include <fmt/format.h>

#include <iterator>

namespace {

std::string Escape(std::string_view text)
{
    std::string escaped;
    for (char const c : text) {
        switch (c) {
        case '&': escaped += "&amp;"; break;
        case '<': escaped += "&lt;"; break;
        case '>': escaped += "&gt;"; break;
        case '"': escaped += "&quot;"; break;
        default: escaped += static_cast<unsigned char>(c) < 0x20 ? '?' : c;  // no others may stand in XML
        }
    }
    return escaped;
}

std::string Stroke(Pen const& pen)
{
    std::string text = fmt::format("stroke=\"{}\" stroke-width=\"{}\"", pen.color, pen.width);
    if (!pen.dashes.empty()) text += fmt::format(" stroke-dasharray=\"{}\"", pen.dashes);
    if (pen.opacity < 1.0) text += fmt::format(" stroke-opacity=\"{}\"", pen.opacity);
    return text;
}

std::string_view NameOf(Anchor anchor)
{
    switch (anchor) {
    case Anchor::Start: return "start";
    case Anchor::Middle: return "middle";
    case Anchor::End: return "end";
    }
    return "";
}

}  // namespace

std::string Svg::Finish(double width, double height) const
{
    return fmt::format("<svg xmlns=\"http://www.w3.org/2000/svg\" viewBox=\"0 0 {0:.0f} {1:.0f}\" width=\"{0:.0f}\" "
                       "height=\"{1:.0f}\" font-family=\"DejaVu Sans, Helvetica, Arial, sans-serif\">\n"
                       "<rect width=\"{0:.0f}\" height=\"{1:.0f}\" fill=\"#ffffff\"/>\n{2}</svg>\n",
                       width, height, text_);
}

void Svg::Rectangle(Point corner, double width, double height, std::string_view fill, Pen const& border)
{
    fmt::format_to(std::back_inserter(text_),
                   "<rect x=\"{:.2f}\" y=\"{:.2f}\" width=\"{:.2f}\" height=\"{:.2f}\" fill=\"{}\" {}/>\n", corner.x,
                   corner.y, width, height, fill, Stroke(border));
}

void Svg::Line(Point from, Point to, Pen const& pen)
{
    fmt::format_to(std::back_inserter(text_), "<line x1=\"{:.2f}\" y1=\"{:.2f}\" x2=\"{:.2f}\" y2=\"{:.2f}\" {}/>\n",
                   from.x, from.y, to.x, to.y, Stroke(pen));
}

void Svg::Polyline(std::span<Point const> points, Pen const& pen)
{
    if (points.size() < 2) return;
    text_ += "<polyline points=\"";
    for (Point const& point : points) fmt::format_to(std::back_inserter(text_), "{:.2f},{:.2f} ", point.x, point.y);
    text_.back() = '"';
    fmt::format_to(std::back_inserter(text_), " fill=\"none\" stroke-linejoin=\"round\" {}/>\n", Stroke(pen));
}

void Svg::Circle(Point center, double radius, std::string_view fill, Pen const& border)
{
    fmt::format_to(std::back_inserter(text_), "<circle cx=\"{:.2f}\" cy=\"{:.2f}\" r=\"{}\" fill=\"{}\" {}/>\n",
                   center.x, center.y, radius, fill, Stroke(border));
}

// Lines without length, whose round ends are the discs.
void Svg::Dots(std::span<Point const> centers, double radius, std::string_view fill)
{
    if (centers.empty()) return;
    text_ += "<path d=\"";
    for (Point const& center : centers)
        fmt::format_to(std::back_inserter(text_), "M{:.2f} {:.2f}h0", center.x, center.y);
    fmt::format_to(std::back_inserter(text_), "\" fill=\"none\" stroke-linecap=\"round\" {}/>\n",
                   Stroke({fill, 2 * radius}));
}

void Svg::Diamond(Point center, double radius, std::string_view fill, Pen const& border)
{
    fmt::format_to(std::back_inserter(text_),
                   "<path d=\"M{0:.2f} {1:.2f}L{2:.2f} {3:.2f}L{0:.2f} {4:.2f}L{5:.2f} {3:.2f}Z\" fill=\"{6}\" {7}/>\n",
                   center.x, center.y - radius, center.x + radius, center.y, center.y + radius, center.x - radius, fill,
                   Stroke(border));
}

void Svg::Text(Point at, std::string_view text, Font const& font)
{
    fmt::format_to(std::back_inserter(text_),
                   "<text x=\"{:.2f}\" y=\"{:.2f}\" font-size=\"{}\" fill=\"{}\" text-anchor=\"{}\"{}{}>{}</text>\n",
                   at.x, at.y, font.size, font.color, NameOf(font.anchor), font.bold ? " font-weight=\"bold\"" : "",
                   font.halo ? " stroke=\"#ffffff\" stroke-width=\"3\" paint-order=\"stroke\"" : "", Escape(text));
}
