#include "cli/command.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/table.h"
#include "cli/usererror.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include <algorithm>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// More than anybody reads, less than memory holds.
constexpr std::int64_t MaxSamples = 1'000'000;
constexpr std::size_t MaxNumbers = 50'000'000;

enum class Format { Table, Csv, Json };

struct Options {
    Selection selection;
    std::string from;  // empty: the first key
    std::string to;    // empty: the last key
    std::string fps = "24";
    Format format = Format::Table;
};

std::vector<Rational> SampleTimes(Options const& options, Rational const& fps, std::optional<TimeSpan> const& span)
{
    TimeSpan const keys = span.value_or(TimeSpan{});
    Rational const from = options.from.empty() ? keys.first : ParseTime(options.from, "--from", fps);
    Rational const to = options.to.empty() ? std::max(keys.last, from) : ParseTime(options.to, "--to", fps);
    if (options.to.empty() && span && from > keys.last) {
        throw UserError("--from", TimeText(from) + " s is after the last key, " + TimeText(keys.last) +
                                      " s; --to says how far to go then");
    }
    if (to < from) throw UserError("--to", TimeText(to) + " s is before --from, " + TimeText(from) + " s");
    Rational const steps = (to - from) * fps;
    std::int64_t const last = steps.Numerator() / steps.Denominator();
    if (last >= MaxSamples) {
        throw UserError("--fps", fmt::format("asks for more than {} times from {} s to {} s", MaxSamples,
                                             TimeText(from), TimeText(to)));
    }
    std::vector<Rational> times;
    for (std::int64_t i = 0; i <= last; ++i) times.push_back(from + Rational(i, 1) / fps);
    return times;
}

// The values of one stream at all times, a row a time; nothing if it has no keys.
struct Samples {
    StreamItem const* item;
    std::vector<double> numbers;

    std::size_t Dimension() const { return item->components.size(); }
    double const* Row(std::size_t index) const { return numbers.data() + index * Dimension(); }
};

std::vector<Samples> TakeSamples(std::vector<StreamItem const*> const& items, std::vector<Rational> const& times)
{
    std::size_t numbers = 0;
    for (StreamItem const* item : items) numbers += item->components.size() * times.size();
    if (numbers > MaxNumbers)
        throw UserError("--fps", fmt::format("asks for {} numbers, more than {}", numbers, MaxNumbers));
    std::vector<Samples> all;
    for (StreamItem const* item : items) {
        Samples samples{item, {}};
        if (kfshost::KeyCount(*item->stream) != 0) {
            samples.numbers.resize(item->components.size() * times.size());
            for (std::size_t i = 0; i < times.size(); ++i)
                kfshost::ReadAt(*item->stream, times[i], samples.numbers.data() + i * item->components.size());
        }
        all.push_back(std::move(samples));
    }
    return all;
}

struct Evaluation {
    Rational fps;
    std::vector<Rational> times;
    std::vector<Samples> samples;
};

std::string ToTables(Evaluation const& evaluation)
{
    std::string text;
    for (Samples const& samples : evaluation.samples) {
        text += (text.empty() ? "" : "\n") + samples.item->path + '\n';
        if (samples.numbers.empty()) {
            text += "no keys\n";
            continue;
        }
        std::vector<Column> columns{{"frame", Align::Right}, {"seconds", Align::Right}};
        for (std::string const& name : samples.item->components) columns.push_back({name, Align::Right});
        Table table(std::move(columns));
        for (std::size_t i = 0; i < evaluation.times.size(); ++i) {
            std::vector<std::string> cells{TimeText(evaluation.times[i] * evaluation.fps),
                                           TimeText(evaluation.times[i])};
            for (std::size_t d = 0; d < samples.Dimension(); ++d) cells.push_back(fmt::format("{}", samples.Row(i)[d]));
            table.AddRow(std::move(cells));
        }
        text += table.ToText();
    }
    return text;
}

std::string CsvCell(std::string const& text)
{
    if (text.find_first_of(",\"") == std::string::npos) return text;
    std::string quoted = "\"";
    for (char const c : text) {
        quoted += c;
        if (c == '"') quoted += c;
    }
    return quoted + '"';
}

std::string ToCsv(Evaluation const& evaluation)
{
    std::string text = "frame,seconds";
    for (Samples const& samples : evaluation.samples)
        for (std::string const& name : samples.item->components) text += ',' + CsvCell(samples.item->path + '.' + name);
    text += '\n';
    for (std::size_t i = 0; i < evaluation.times.size(); ++i) {
        text += fmt::format("{},{}", (evaluation.times[i] * evaluation.fps).ToString(), evaluation.times[i].ToDouble());
        for (Samples const& samples : evaluation.samples) {
            for (std::size_t d = 0; d < samples.Dimension(); ++d) {
                text += ',';
                if (!samples.numbers.empty()) fmt::format_to(std::back_inserter(text), "{}", samples.Row(i)[d]);
            }
        }
        text += '\n';
    }
    return text;
}

nlohmann::ordered_json Pair(Rational const& number)
{
    return {number.Numerator(), number.Denominator()};
}

std::string ToJson(Evaluation const& evaluation)
{
    nlohmann::ordered_json document;
    document["fps"] = Pair(evaluation.fps);
    document["times"] = nlohmann::ordered_json::array();
    for (Rational const& time : evaluation.times) document["times"].push_back(Pair(time));
    document["streams"] = nlohmann::ordered_json::array();
    for (Samples const& samples : evaluation.samples) {
        nlohmann::ordered_json stream;
        stream["path"] = samples.item->path;
        stream["kind"] = NameOf(samples.item->kind);
        stream["interpolation"] = NameOf(samples.item->interpolation);
        stream["components"] = samples.item->components;
        stream["values"] = nlohmann::ordered_json::array();
        for (std::size_t i = 0; i < samples.numbers.size() / samples.Dimension(); ++i)
            stream["values"].push_back(std::vector<double>(samples.Row(i), samples.Row(i) + samples.Dimension()));
        document["streams"].push_back(std::move(stream));
    }
    return document.dump() + '\n';
}

std::string ToText(Evaluation const& evaluation, Format format)
{
    switch (format) {
    case Format::Csv: return ToCsv(evaluation);
    case Format::Json: return ToJson(evaluation);
    case Format::Table: break;
    }
    return ToTables(evaluation);
}

int Run(Options const& options)
{
    Rational const fps = ParseFps(options.fps);
    kfshost::Scene const scene = LoadScene(options.selection);
    auto const items = SelectStreams(scene, options.selection);
    Evaluation evaluation{fps, SampleTimes(options, fps, SpanOf(items)), {}};
    evaluation.samples = TakeSamples(items, evaluation.times);
    WriteToStandardOutput(ToText(evaluation, options.format));
    return ExitDone;
}

Format FormatNamed(std::string const& name)
{
    return name == "csv" ? Format::Csv : name == "json" ? Format::Json : Format::Table;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    AddSelection(command, options->selection);
    command
        .add_option("--from", options->from,
                    "first time: seconds like 0.5 or 1/24, or frames like 12f (default: first key)")
        ->type_name("TIME");
    command.add_option("--to", options->to, "last time (default: last key)")->type_name("TIME");
    command.add_option("--fps", options->fps, "samples a second, like 24 or 30000/1001")
        ->type_name("RATE")
        ->capture_default_str();
    command
        .add_option_function<std::string>(
            "--format", [options](std::string const& name) { options->format = FormatNamed(name); },
            "how to print (default: table)")
        ->check(CLI::IsMember({"table", "csv", "json"}))
        ->type_name("FORMAT");
    command.footer(
        "Numbers are printed with as many digits as it takes to read the same number back. JSON gives times as\n"
        "[numerator, denominator] in seconds, which is exact; tables print them as fractions or decimals.");
    return [options] { return Run(*options); };
}

}  // namespace

Command const EvalCommand{"Look into files", "eval", "Print values at regular times", Prepare};
