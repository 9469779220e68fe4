#pragma once

#include <string>
#include <vector>

enum class Align { Left, Right };

struct Column {
    std::string title;
    Align align;
};

// Text in columns, as wide as their widest cell.
class Table {
public:
    explicit Table(std::vector<Column> columns);

    // As many cells as there are columns.
    void AddRow(std::vector<std::string> cells);
    // Title and rows, each line ended, without blanks at the end.
    std::string ToText() const;

private:
    std::vector<Column> columns_;
    std::vector<std::vector<std::string>> rows_;
};
