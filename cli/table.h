#pragma once

#include <cstddef>
#include <string>
#include <vector>

enum class Align { Left, Right };

struct Column {
    std::string title;
    Align align;
};

// Lines in columns. What doesn't fit into memory at once is measured first and printed line by line then.
class TableLayout {
public:
    explicit TableLayout(std::vector<Column> columns);

    // Makes columns wide enough for a row, which has as many cells as there are columns.
    void Measure(std::vector<std::string> const& cells);
    // Ended, without blanks at the end.
    std::string TitleLine() const;
    std::string Line(std::vector<std::string> const& cells) const;

private:
    std::vector<Column> columns_;
    std::vector<std::size_t> widths_;
};

// Text in columns, as wide as their widest cell.
class Table {
public:
    explicit Table(std::vector<Column> columns) : layout_(std::move(columns)) {}

    // As many cells as there are columns.
    void AddRow(std::vector<std::string> cells);
    // Title and rows, each line ended, without blanks at the end.
    std::string ToText() const;

private:
    TableLayout layout_;
    std::vector<std::vector<std::string>> rows_;
};
