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

Table::Table(std::vector<Column> columns) : columns_(std::move(columns))
{
    std::vector<std::string> titles;
    for (Column const& column : columns_) titles.push_back(column.title);
    rows_.push_back(std::move(titles));
}

void Table::AddRow(std::vector<std::string> cells)
{
    rows_.push_back(std::move(cells));
}

std::string Table::ToText() const
{
    std::vector<std::size_t> widths(columns_.size(), 0);
    for (auto const& row : rows_)
        for (std::size_t i = 0; i < row.size(); ++i) widths[i] = std::max(widths[i], Width(row[i]));
    std::string text;
    for (auto const& row : rows_) {
        std::string line;
        for (std::size_t i = 0; i < row.size(); ++i) {
            std::string const blanks(widths[i] - Width(row[i]), ' ');
            line += (i == 0 ? "" : "  ") + (columns_[i].align == Align::Left ? row[i] + blanks : blanks + row[i]);
        }
        line.erase(line.find_last_not_of(' ') + 1);
        text += line + '\n';
    }
    return text;
}
