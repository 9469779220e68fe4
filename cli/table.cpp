#include "cli/table.h"

#include <algorithm>
#include <cstddef>

namespace {

// Code points: near enough to what a terminal shows.
std::size_t Width(std::string const& text)
{
    return static_cast<std::size_t>(std::ranges::count_if(
        text, [](char c) { return (static_cast<unsigned char>(c) & 0xC0) != 0x80; }));
}

}  // namespace

TableLayout::TableLayout(std::vector<Column> columns) : columns_(std::move(columns))
{
    for (Column const& column : columns_) widths_.push_back(Width(column.title));
}

void TableLayout::Measure(std::vector<std::string> const& cells)
{
    for (std::size_t i = 0; i < cells.size(); ++i) widths_[i] = std::max(widths_[i], Width(cells[i]));
}

std::string TableLayout::TitleLine() const
{
    std::vector<std::string> titles;
    for (Column const& column : columns_) titles.push_back(column.title);
    return Line(titles);
}

std::string TableLayout::Line(std::vector<std::string> const& cells) const
{
    std::string line;
    for (std::size_t i = 0; i < cells.size(); ++i) {
        std::string const blanks(widths_[i] - Width(cells[i]), ' ');
        line += (i == 0 ? "" : "  ") + (columns_[i].align == Align::Left ? cells[i] + blanks : blanks + cells[i]);
    }
    line.erase(line.find_last_not_of(' ') + 1);
    return line + '\n';
}

void Table::AddRow(std::vector<std::string> cells)
{
    layout_.Measure(cells);
    rows_.push_back(std::move(cells));
}

std::string Table::ToText() const
{
    std::string text = layout_.TitleLine();
    for (auto const& row : rows_) text += layout_.Line(row);
    return text;
}
