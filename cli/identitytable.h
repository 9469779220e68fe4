#pragma once

#include "cli/output.h"
#include "host/rational.h"

#include <map>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

// Render identities by time, as a text that is the same on every machine and can be read back: what a cache of rendered
// frames keeps beside them.

// What the identities of one column are of.
inline constexpr std::string_view WholeTree = "tree";  // else a stream's path, which has slashes

struct IdentitySpan {
    kfshost::Rational start;   // seconds
    kfshost::Rational length;  // 0: a moment

    auto operator<=>(IdentitySpan const&) const = default;  // NOLINT(modernize-use-nullptr): a default has no zero
};

struct IdentityTable {
    std::optional<kfshost::Rational> fps;  // how frames are numbered; not known of a table that was CSV
    std::vector<std::string> columns;
    struct Row {
        IdentitySpan span;
        std::vector<std::string> identities;  // 32 hexadecimal digits; empty where nothing has a value
    };
    std::vector<Row> rows;
};

enum class TableFormat { Table, Csv, Json };

void WriteIdentities(IdentityTable const& table, TableFormat format, Output& output);
// Of CSV or JSON as it was written. Throws UserError.
IdentityTable ReadIdentities(std::string const& fileName);

// A row against the earlier table.
struct IdentityVerdict {
    enum class State { Same, Changed, New };  // New: the earlier table doesn't have it
    IdentitySpan span;
    State state;
    std::vector<std::string> differing;  // the columns that do, or aren't in the earlier table
};

// Throws UserError where the tables have no column in common.
std::vector<IdentityVerdict> CompareIdentities(IdentityTable const& now, IdentityTable const& earlier,
                                               std::string const& earlierName);
void WriteVerdicts(std::vector<IdentityVerdict> const& verdicts, kfshost::Rational const& fps, TableFormat format,
                   Output& output);
