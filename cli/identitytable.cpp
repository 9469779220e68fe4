#include "cli/identitytable.h"

#include "cli/selection.h"
#include "cli/table.h"
#include "cli/usererror.h"

#include <fmt/format.h>
#include <fmt/ranges.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <fstream>
#include <iterator>

using kfshost::Rational;

namespace {

using Json = nlohmann::json;

constexpr std::string_view FixedColumns[] = {"frame", "start", "length"};
constexpr std::size_t IdentityDigits = 32;

std::string_view NameOf(IdentityVerdict::State state)
{
    switch (state) {
    case IdentityVerdict::State::Same: return "same";
    case IdentityVerdict::State::Changed: return "changed";
    case IdentityVerdict::State::New: return "new";
    }
    return "";
}

// How a span begins in CSV: exact fractions.
std::string CsvStart(IdentitySpan const& span, Rational const& fps)
{
    return fmt::format("{},{},{}", (span.start * fps).ToString(), span.start.ToString(), span.length.ToString());
}

Json Pair(Rational const& number)
{
    return Json::array({number.Numerator(), number.Denominator()});
}

std::vector<std::string> Cells(IdentitySpan const& span, Rational const& fps)
{
    return {TimeText(span.start * fps), TimeText(span.start), TimeText(span.length)};
}

std::vector<Column> LeadingColumns()
{
    return {{"frame", Align::Right}, {"seconds", Align::Right}, {"length", Align::Right}};
}

// ---- reading back

class Reading {
public:
    explicit Reading(std::string const& fileName) : name_(fileName) {}

    [[noreturn]] void Fail(std::string const& what) const
    {
        throw UserError(Shown(name_), what + " (a table of identities is CSV or JSON as kfs identity writes it)");
    }
    Rational Fraction(std::string const& text) const
    {
        auto const number = Rational::Parse(text);
        if (!number) Fail('"' + text + "\" isn't a time");
        return *number;
    }
    std::string Identity(std::string const& text) const
    {
        bool const isOne =
            text.size() == IdentityDigits && text.find_first_not_of("0123456789abcdef") == std::string::npos;
        if (!isOne && !text.empty()) Fail('"' + text + "\" isn't an identity");
        return text;
    }

    IdentityTable FromCsv(std::string const& text) const
    {
        auto lines = Lines(text);
        if (lines.empty() || lines.front().size() < std::size(FixedColumns) ||
            !std::equal(std::begin(FixedColumns), std::end(FixedColumns), lines.front().begin()))
            Fail("doesn't begin with frame, start and length");
        IdentityTable table;
        table.columns.assign(lines.front().begin() + std::size(FixedColumns), lines.front().end());
        for (std::size_t i = 1; i < lines.size(); ++i) {
            auto const& cells = lines[i];
            if (cells.size() != lines.front().size()) Fail(fmt::format("line {} has another number of cells", i + 1));
            IdentityTable::Row row{{Fraction(cells[1]), Fraction(cells[2])}, {}};
            for (std::size_t c = std::size(FixedColumns); c < cells.size(); ++c)
                row.identities.push_back(Identity(cells[c]));
            table.rows.push_back(std::move(row));
        }
        return table;
    }

    IdentityTable FromJson(std::string const& text) const
    try {
        Json const json = Json::parse(text);
        IdentityTable table;
        table.fps = FromPair(json.at("fps"));
        table.columns = json.at("of").get<std::vector<std::string>>();
        for (Json const& written : json.at("rows")) {
            IdentityTable::Row row{{FromPair(written.at("start")), FromPair(written.at("length"))}, {}};
            for (Json const& identity : written.at("identities"))
                row.identities.push_back(Identity(identity.is_null() ? "" : identity.get<std::string>()));
            if (row.identities.size() != table.columns.size()) Fail("a row has another number of identities");
            table.rows.push_back(std::move(row));
        }
        return table;
    } catch (Json::exception const& error) {
        Fail(error.what());
    }

private:
    // Cells may be in quotes, with anything in them.
    std::vector<std::vector<std::string>> Lines(std::string const& text) const
    {
        std::vector<std::vector<std::string>> lines;
        std::vector<std::string> cells(1);
        bool isQuoted = false;
        for (std::size_t i = 0; i < text.size(); ++i) {
            char const c = text[i];
            if (c == '"' && isQuoted && i + 1 < text.size() && text[i + 1] == '"')
                cells.back() += text[++i];
            else if (c == '"')
                isQuoted = !isQuoted;
            else if (isQuoted || (c != ',' && c != '\n' && c != '\r'))
                cells.back() += c;
            else if (c == ',')
                cells.emplace_back();
            else if (c == '\n')
                lines.push_back(std::exchange(cells, std::vector<std::string>(1)));
        }
        if (isQuoted || cells != std::vector<std::string>(1)) Fail("ends in the middle of a line");
        return lines;
    }

    Rational FromPair(Json const& pair) const
    {
        auto const denominator = pair.at(1).get<std::int64_t>();
        if (denominator <= 0) Fail("has a time that is no fraction");
        return {pair.at(0).get<std::int64_t>(), denominator};
    }

    std::string const& name_;
};

}  // namespace

void WriteIdentities(IdentityTable const& table, TableFormat format, Output& output)
{
    Rational const& fps = *table.fps;
    if (format == TableFormat::Json) {
        output.Add(R"({"fps":)" + Pair(fps).dump() + R"(,"of":)" + Json(table.columns).dump() + R"(,"rows":[)");
        for (std::size_t i = 0; i < table.rows.size(); ++i) {
            IdentityTable::Row const& row = table.rows[i];
            Json identities = Json::array();
            for (std::string const& identity : row.identities)
                identities.push_back(identity.empty() ? Json() : Json(identity));
            output.Add(fmt::format(R"({}{{"start":{},"length":{},"identities":{}}})", i == 0 ? "\n" : ",\n",
                                   Pair(row.span.start).dump(), Pair(row.span.length).dump(), identities.dump()));
        }
        output.Add("]}\n");
    } else if (format == TableFormat::Csv) {
        output.Add(fmt::format("{}", fmt::join(FixedColumns, ",")));
        for (std::string const& column : table.columns) output.Add(',' + CsvCell(column));
        output.Add("\n");
        for (IdentityTable::Row const& row : table.rows)
            output.Add(fmt::format("{},{}\n", CsvStart(row.span, fps), fmt::join(row.identities, ",")));
    } else {
        std::vector<Column> columns = LeadingColumns();
        for (std::string const& column : table.columns) columns.push_back({column, Align::Left});
        Table text(std::move(columns));
        for (IdentityTable::Row const& row : table.rows) {
            auto cells = Cells(row.span, fps);
            for (std::string const& identity : row.identities) cells.push_back(identity.empty() ? "-" : identity);
            text.AddRow(std::move(cells));
        }
        output.Add(text.ToText());
    }
}

IdentityTable ReadIdentities(std::string const& fileName)
{
    std::ifstream file(fileName, std::ios::binary);
    std::string const text{std::istreambuf_iterator<char>(file), {}};
    if (!file) throw UserError(Shown(fileName), "can't be read");
    Reading const reading(fileName);
    return text.starts_with('{') ? reading.FromJson(text) : reading.FromCsv(text);
}

std::vector<IdentityVerdict> CompareIdentities(IdentityTable const& now, IdentityTable const& earlier,
                                               std::string const& earlierName)
{
    std::map<std::string, std::size_t> columns;
    for (std::size_t c = 0; c < earlier.columns.size(); ++c) columns.emplace(earlier.columns[c], c);
    if (std::ranges::none_of(now.columns, [&](std::string const& column) { return columns.contains(column); }))
        throw UserError(Shown(earlierName), "has identities of something else than is asked for");
    std::map<IdentitySpan, IdentityTable::Row const*> rows;
    for (IdentityTable::Row const& row : earlier.rows) rows.emplace(row.span, &row);
    std::vector<IdentityVerdict> verdicts;
    for (IdentityTable::Row const& row : now.rows) {
        auto const before = rows.find(row.span);
        IdentityVerdict verdict{row.span, IdentityVerdict::State::New, {}};
        if (before != rows.end()) {
            for (std::size_t c = 0; c < now.columns.size(); ++c) {
                auto const column = columns.find(now.columns[c]);
                if (column == columns.end() || before->second->identities[column->second] != row.identities[c])
                    verdict.differing.push_back(now.columns[c]);
            }
            verdict.state = verdict.differing.empty() ? IdentityVerdict::State::Same : IdentityVerdict::State::Changed;
        }
        verdicts.push_back(std::move(verdict));
    }
    return verdicts;
}

void WriteVerdicts(std::vector<IdentityVerdict> const& verdicts, Rational const& fps, TableFormat format,
                   Output& output)
{
    if (format == TableFormat::Json) {
        output.Add(R"({"fps":)" + Pair(fps).dump() + R"(,"rows":[)");
        for (std::size_t i = 0; i < verdicts.size(); ++i) {
            IdentityVerdict const& verdict = verdicts[i];
            output.Add(fmt::format(R"({}{{"start":{},"length":{},"state":"{}","differing":{}}})", i == 0 ? "\n" : ",\n",
                                   Pair(verdict.span.start).dump(), Pair(verdict.span.length).dump(),
                                   NameOf(verdict.state), Json(verdict.differing).dump()));
        }
        output.Add("]}\n");
    } else if (format == TableFormat::Csv) {
        output.Add(fmt::format("{},state,differing\n", fmt::join(FixedColumns, ",")));
        for (IdentityVerdict const& verdict : verdicts)
            output.Add(fmt::format("{},{},{}\n", CsvStart(verdict.span, fps), NameOf(verdict.state),
                                   CsvCell(fmt::format("{}", fmt::join(verdict.differing, " ")))));
    } else {
        std::vector<Column> columns = LeadingColumns();
        columns.push_back({"state", Align::Left});
        columns.push_back({"differing", Align::Left});
        Table text(std::move(columns));
        std::size_t anew = 0;
        for (IdentityVerdict const& verdict : verdicts) {
            anew += verdict.state == IdentityVerdict::State::Same ? 0 : 1;
            auto cells = Cells(verdict.span, fps);
            cells.emplace_back(NameOf(verdict.state));
            cells.push_back(fmt::format("{}", fmt::join(verdict.differing, " ")));
            text.AddRow(std::move(cells));
        }
        output.Add(text.ToText() + fmt::format("\n{} of {} to render anew\n", anew, verdicts.size()));
    }
}
