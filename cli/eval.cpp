#include "cli/command.h"
#include "cli/errors.h"
#include "cli/expressions.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/overridewords.h"
#include "cli/rates.h"
#include "cli/sampletimes.h"
#include "cli/table.h"
#include "host/rotations.h"
#include "host/storeerror.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cmath>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// More than anybody reads.
constexpr std::size_t MaxNumbers = 50'000'000;

enum class Format { Table, Csv, Json };

struct Options {
    Selection selection;
    SampleWords times;
    OverrideWords overrides;
    bool raw = false;   // the stored components of rotations, not normalised
    bool rate = false;  // rates of change in place of values
    std::string euler;  // rotations as angles about the axes in this order; empty: as quaternions
    Format format = Format::Table;
};

// What is printed of a stream: its components, or what they mean where they are a rotation's, or their rates.
class Shown {
public:
    Shown(StreamItem const& item, Options const& options, KFS_ParamBag const* bag)
        : item_(&item),
          bag_(bag),
          components_(item.components)
    {
        isRotation_ = kfshost::IsRotation(item) && !options.raw;
        if (options.rate) {
            rates_.emplace(*item.stream, isRotation_);
            for (std::string& name : components_) name += "/s";
        }
        if (isRotation_ && !options.euler.empty()) {
            order_ = kfshost::EulerOrder::Parse(options.euler);
            components_ = order_->Components();
        }
        stored_.resize(item.components.size());
        row_.resize(components_.size());
    }

    StreamItem const& Item() const { return *item_; }
    std::vector<std::string> const& Components() const { return components_; }
    // Keys, or an expression that hasn't failed.
    bool HasValues() const
    {
        return !FailureOf(*item_) && (kfshost::HasKeys(*item_->stream) || HasActiveExpression(*item_));
    }
    bool AreRates() const { return rates_.has_value(); }

    // Valid until the next call.
    std::vector<double> const& Read(Rational const& time)
    {
        if (rates_) return rates_->At(time.ToUnits(item_->stream->GetTimeScale()));
        kfshost::ReadAt(*item_->stream, time, stored_.data(), bag_);
        if (isRotation_) kfshost::Normalise(stored_.data());
        if (order_)
            kfshost::ToEuler(stored_.data(), *order_, row_.data());
        else
            row_ = stored_;
        return row_;
    }

private:
    StreamItem const* item_;
    KFS_ParamBag const* bag_;
    std::vector<std::string> components_;
    bool isRotation_ = false;
    std::optional<kfshost::EulerOrder> order_;
    std::optional<Rates> rates_;
    std::vector<double> stored_;
    std::vector<double> row_;
};

struct Evaluation {
    Rational fps;
    std::vector<Rational> times;
    std::vector<Shown> streams;
};

// A stream whose expression fails, at whatever time, has no values; without keys there is nothing to fall back to either.
// Answers whether any has failed.
bool TryStream(Evaluation const& evaluation, Shown& stream, Selection const& selection)
try {
    bool anyFailed = false;
    if (!stream.HasValues()) return anyFailed;
    for (Rational const& time : evaluation.times) {
        stream.Read(time);
        anyFailed = TellFailedExpressions(selection) || anyFailed;  // at once: what was told isn't run again
    }
    return anyFailed;
} catch (kfshost::StoreError const&) {
    TellFailedExpressions(selection);
    if (!FailureOf(stream.Item())) throw;
    return true;
}

// Reads everything once: a failed command writes nothing, and what is written isn't held in memory.
void TryAll(Evaluation& evaluation, Selection const& selection)
{
    std::size_t numbers = 0;
    for (Shown const& stream : evaluation.streams) numbers += stream.Components().size() * evaluation.times.size();
    if (numbers > MaxNumbers)
        throw UserError("--fps", fmt::format("asks for {} numbers, more than {}", numbers, MaxNumbers));
    // Once one has failed, so may others that read it, which went well before.
    for (bool again = true; again;) {
        again = false;
        for (Shown& stream : evaluation.streams) again = TryStream(evaluation, stream, selection) || again;
    }
}

std::vector<std::string> TableRow(Evaluation const& evaluation, std::size_t index, Shown& stream)
{
    std::vector<std::string> cells{TimeText(evaluation.times[index] * evaluation.fps),
                                   TimeText(evaluation.times[index])};
    for (double const number : stream.Read(evaluation.times[index])) cells.push_back(fmt::format("{}", number));
    return cells;
}

void WriteTable(Evaluation const& evaluation, Shown& stream, Output& output)
{
    std::vector<Column> columns{{"frame", Align::Right}, {"seconds", Align::Right}};
    for (std::string const& name : stream.Components()) columns.push_back({name, Align::Right});
    TableLayout layout(std::move(columns));
    for (std::size_t i = 0; i < evaluation.times.size(); ++i) layout.Measure(TableRow(evaluation, i, stream));
    output.Add(layout.TitleLine());
    for (std::size_t i = 0; i < evaluation.times.size(); ++i) output.Add(layout.Line(TableRow(evaluation, i, stream)));
}

void WriteTables(Evaluation& evaluation, Output& output)
{
    bool isFirst = true;
    for (Shown& stream : evaluation.streams) {
        output.Add((isFirst ? "" : "\n") + stream.Item().path + '\n');
        isFirst = false;
        if (stream.HasValues())
            WriteTable(evaluation, stream, output);
        else
            output.Add(FailureOf(stream.Item()) ? "no value\n" : "no keys\n");
    }
}

void WriteCsv(Evaluation& evaluation, Output& output)
{
    output.Add("frame,seconds");
    for (Shown const& stream : evaluation.streams)
        for (std::string const& name : stream.Components()) output.Add(',' + CsvCell(stream.Item().path + '.' + name));
    output.Add("\n");
    for (Rational const& time : evaluation.times) {
        output.Add(fmt::format("{},{}", (time * evaluation.fps).ToString(), time.ToDouble()));
        for (Shown& stream : evaluation.streams) {
            if (!stream.HasValues())
                output.Add(std::string(stream.Components().size(), ','));
            else
                for (double const number : stream.Read(time)) output.Add(fmt::format(",{}", number));
        }
        output.Add("\n");
    }
}

// A fraction as JSON.
std::string Pair(Rational const& number)
{
    return fmt::format("[{},{}]", number.Numerator(), number.Denominator());
}

void WriteJsonStream(Evaluation const& evaluation, Shown& stream, Output& output)
{
    output.Add(fmt::format(R"({{"path":{},"kind":{},"interpolation":{},"components":{},"{}":[)",
                           Quoted(stream.Item().path), Quoted(NameOf(stream.Item().kind)),
                           Quoted(NameOf(stream.Item().interpolation)), nlohmann::json(stream.Components()).dump(),
                           stream.AreRates() ? "rates" : "values"));
    bool const hasValues = stream.HasValues();
    for (std::size_t i = 0; hasValues && i < evaluation.times.size(); ++i)
        output.Add((i == 0 ? "" : ",") + nlohmann::json(stream.Read(evaluation.times[i])).dump());
    output.Add("]");
    if (auto const failure = FailureOf(stream.Item()))
        output.Add(fmt::format(R"(,"error":{{"line":{},"text":{}}})",
                               failure->line > 0 ? std::to_string(failure->line) : "null", Quoted(failure->text)));
    output.Add("}");
}

void WriteJson(Evaluation& evaluation, Output& output)
{
    output.Add(R"({"fps":)" + Pair(evaluation.fps) + R"(,"times":[)");
    for (std::size_t i = 0; i < evaluation.times.size(); ++i)
        output.Add((i == 0 ? "" : ",") + Pair(evaluation.times[i]));
    output.Add(R"(],"streams":[)");
    for (std::size_t i = 0; i < evaluation.streams.size(); ++i) {
        output.Add(i == 0 ? "" : ",");
        WriteJsonStream(evaluation, evaluation.streams[i], output);
    }
    output.Add("]}\n");
}

// Times between the keys that the streams' scale has no unit for.
void TellRounding(Evaluation const& evaluation, std::optional<TimeSpan> const& span, Selection const& selection)
{
    double worst = 0.0;
    unsigned int scale = 0;
    for (Shown const& stream : evaluation.streams) {
        scale = stream.Item().stream->GetTimeScale();
        for (Rational const& time : evaluation.times) {
            if (!span || time < span->first || span->last < time) continue;
            double const read = static_cast<double>(time.ToUnits(scale)) / scale;
            if (Rational(time.ToUnits(scale), scale) != time) worst = std::max(worst, std::abs(read - time.ToDouble()));
        }
        break;  // one scale serves all streams of a file
    }
    if (worst > 0.0) {
        TellAbout(selection.file,
                  fmt::format("{} are those of the nearest 1/{} s, up to {:.2g} s from the times shown",
                              evaluation.streams.front().AreRates() ? "rates" : "values", scale, worst));
    }
}

void CheckOptions(Options const& options)
{
    if (options.rate && options.overrides.Any())
        throw UserError("--rate", "tells the rates of keys, so it can't go with overrides");
    if (options.euler.empty()) return;
    if (options.rate)
        throw UserError("--rate", "tells the rates of a rotation's components, so it can't go with --euler");
    if (options.raw) throw UserError("--raw", "shows components as they are stored, so it can't go with --euler");
    if (!kfshost::EulerOrder::Parse(options.euler))
        throw UserError("--euler", '"' + options.euler + "\" isn't an order of the three axes like XYZ or ZXY");
}

int Run(Options const& options)
{
    CheckOptions(options);
    auto const asked = AskedFps(options.times);
    kfshost::Scene const scene =
        options.overrides.Any() ? LoadSceneInTree(options.selection) : LoadScene(options.selection);
    Overrides const overrides(scene, options.selection, options.overrides);
    auto const items = SelectStreams(scene, options.selection);
    auto const span = SpanOf(items);
    Rational const fps = asked ? *asked : FindFps(items, options.selection);
    Evaluation evaluation{fps, SampleTimes(options.times, fps, span), {}};
    for (StreamItem const* item : items) evaluation.streams.emplace_back(*item, options, overrides.Bag());
    TryAll(evaluation, options.selection);
    TellRounding(evaluation, span, options.selection);
    Output output;
    switch (options.format) {
    case Format::Csv: WriteCsv(evaluation, output); break;
    case Format::Json: WriteJson(evaluation, output); break;
    case Format::Table: WriteTables(evaluation, output); break;
    }
    output.Flush();
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
    AddNoExpressions(command, options->selection);
    AddSampleWords(command, options->times);
    AddOverrideWords(command, options->overrides);
    command.add_flag("--raw", options->raw, "rotations as they are stored, of any length (default: of length 1)");
    command.add_flag("--rate", options->rate,
                     "how fast values change, in their units a second: behind a key, at the last key before it");
    command
        .add_option("--euler", options->euler,
                    "rotations as degrees about the axes, whose matrices are multiplied in this order, like XYZ")
        ->type_name("ORDER");
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

Command const EvalCommand{"Look into files", "eval", "Print values, or their rates, at regular times", Prepare};
