#pragma once

#include "cli/panel.h"

#include <span>
#include <string_view>
#include <vector>

// Finds places for short texts beside marks, where they cover as little as possible of what is drawn.
class Labels {
public:
    Labels(PanelBox const& room, double fontSize) : room_(room), fontSize_(fontSize) {}

    // A line that texts keep off, and a mark.
    void AvoidLine(std::span<Point const> line);
    void AvoidPoint(Point point) { avoided_.push_back(point); }
    // Where the middle of the text's base line goes. Later texts keep off this one.
    Point Place(Point mark, double radius, std::string_view text);

private:
    struct Box {
        double left;
        double top;
        double right;
        double bottom;
    };
    double CostOf(Box const& box) const;

    PanelBox room_;
    double fontSize_;
    std::vector<Point> avoided_;
    std::vector<Box> taken_;
};
