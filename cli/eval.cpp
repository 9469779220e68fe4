#include "cli/command.h"
#include "cli/errors.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/rates.h"
#include "cli/table.h"
#include "host/framegrid.h"
#include "host/rotations.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cmath>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// More than anybody reads.
constexpr std::int64_t MaxSamples = 1'000'000;
constexpr std::size_t MaxNumbers = 50'000'000;

enum class Format { Table, Csv, Json };

struct Options {
    Selection selection;
    std::string from;   // empty: the frame at or before the first key
    std::string to;     // empty: the frame at or after the last key
    std::string fps;    // empty: the rate of the keys
    bool raw = false;   // the stored components of rotations, not normalised
    bool rate = false;  // rates of change in place of values
    std::string euler;  // rotations as angles about the axes in this order; empty: as quaternions
    Format format = Format::Table;
};

// The frame at or before a time.
std::int64_t FrameBefore(Rational const& seconds, Rational const& fps)
{
    Rational const frames = seconds * fps;
    std::int64_t const quotient = frames.Numerator() / frames.Denominator();
    return frames < Rational(quotient, 1) ? quotient - 1 : quotient;
}

// Whole frames from the one at or before the first key to the one at or after the last, so that both poses are in. What
// is asked for begins at the time that is asked for.
std::vector<Rational> SampleTimes(Options const& options, Rational const& fps, std::optional<TimeSpan> const& span)
{
    TimeSpan const keys = span.value_or(TimeSpan{});
    Rational const from = options.from.empty()
                              ? Fitting("--fps", [&] { return Rational(FrameBefore(keys.first, fps), 1) / fps; })
                              : ParseTime(options.from, "--from", fps);
    Rational const to = options.to.empty() ? std::max(keys.last, from) : ParseTime(options.to, "--to", fps);
    if (options.to.empty() && span && from > keys.last) {
        throw UserError("--from", TimeText(from) + " s is after the last key, " + TimeText(keys.last) +
                                      " s; --to says how far to go then");
    }
    if (to < from) throw UserError("--to", TimeText(to) + " s is before --from, " + TimeText(from) + " s");
    Rational const length = Fitting(
        options.from.empty() ? "--to" : "--from", [&] { return to - from; });
    Rational const steps = Fitting("--fps", [&] { return length * fps; });
    bool const isBetween = options.to.empty() && steps.Denominator() != 1;
    std::int64_t const last = FrameBefore(length, fps) + (isBetween ? 1 : 0);
    if (last >= MaxSamples) {
        throw UserError("--fps", fmt::format("asks for more than {} times from {} s to {} s", MaxSamples,
                                             TimeText(from), TimeText(to)));
    }
    std::vector<Rational> times;
    for (std::int64_t i = 0; i <= last; ++i)
        times.push_back(Fitting("--fps", [&] { return from + Rational(i, 1) / fps; }));
    return times;
}

// What is printed of a stream: its components, or what they mean where they are a rotation's, or their rates.
class Shown {
public:
    Shown(StreamItem const& item, Options const& options) : item_(&item), components_(item.components)
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
    bool HasKeys() const { return kfshost::HasKeys(*item_->stream); }
    bool AreRates() const { return rates_.has_value(); }

    // Valid until the next call.
    std::vector<double> const& Read(Rational const& time)
    {
        if (rates_) return rates_->At(time.ToUnits(item_->stream->GetTimeScale()));
        kfshost::ReadAt(*item_->stream, time, stored_.data());
        if (isRotation_) kfshost::Normalise(stored_.data());
        if (order_)
            kfshost::ToEuler(stored_.data(), *order_, row_.data());
        else
            row_ = stored_;
        return row_;
    }

private:
    StreamItem const* item_;
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

// Reads everything once: a failed command writes nothing, and what is written isn't held in memory.
void TryAll(Evaluation& evaluation)
{
    std::size_t numbers = 0;
    for (Shown const& stream : evaluation.streams) numbers += stream.Components().size() * evaluation.times.size();
    if (numbers > MaxNumbers)
        throw UserError("--fps", fmt::format("asks for {} numbers, more than {}", numbers, MaxNumbers));
    for (Shown& stream : evaluation.streams)
        if (stream.HasKeys())
            for (Rational const& time : evaluation.times) stream.Read(time);
}

// Text on its way to the standard output, in large pieces.
class Output {
public:
    void Add(std::string_view text)
    {
        text_ += text;
        constexpr std::size_t piece = 1 << 16;
        if (text_.size() >= piece) Flush();
    }
    void Flush()
    {
        WriteToStandardOutput(text_);
        text_.clear();
    }

private:
    std::string text_;
};

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
        if (stream.HasKeys())
            WriteTable(evaluation, stream, output);
        else
            output.Add("no keys\n");
    }
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

void WriteCsv(Evaluation& evaluation, Output& output)
{
    output.Add("frame,seconds");
    for (Shown const& stream : evaluation.streams)
        for (std::string const& name : stream.Components()) output.Add(',' + CsvCell(stream.Item().path + '.' + name));
    output.Add("\n");
    for (Rational const& time : evaluation.times) {
        output.Add(fmt::format("{},{}", (time * evaluation.fps).ToString(), time.ToDouble()));
        for (Shown& stream : evaluation.streams) {
            if (!stream.HasKeys())
                output.Add(std::string(stream.Components().size(), ','));
            else
                for (double const number : stream.Read(time)) output.Add(fmt::format(",{}", number));
        }
        output.Add("\n");
    }
}

std::string Quoted(std::string_view text)
{
    return nlohmann::json(text).dump();
}

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
    for (std::size_t i = 0; stream.HasKeys() && i < evaluation.times.size(); ++i)
        output.Add((i == 0 ? "" : ",") + nlohmann::json(stream.Read(evaluation.times[i])).dump());
    output.Add("]}");
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

// Keys that aren't on the frames at which values are shown, where nobody asked for those frames.
void TellStrangers(kfshost::FrameGrid const& grid, Selection const& selection)
{
    if (grid.offGrid == 0) return;
    TellAbout(selection.file,
              fmt::format("{} of {} aren't frames of {} a second, but up to {:.2g} of a frame beside "
                          "them; --fps asks for another rate",
                          grid.offGrid, Plural(grid.times, "key time", "key times"), grid.rate.ToString(), grid.worst));
}

// The rate of the keys.
Rational FindFps(Options const& options, std::vector<StreamItem const*> const& items)
{
    kfshost::FrameGrid const grid = kfshost::FindFrameGrid(items);
    TellStrangers(grid, options.selection);
    return grid.rate;
}

void CheckOptions(Options const& options)
{
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
    auto const asked = options.fps.empty() ? std::nullopt : std::optional(ParseFps(options.fps));
    kfshost::Scene const scene = LoadScene(options.selection);
    auto const items = SelectStreams(scene, options.selection);
    auto const span = SpanOf(items);
    Rational const fps = asked ? *asked : FindFps(options, items);
    Evaluation evaluation{fps, SampleTimes(options, fps, span), {}};
    for (StreamItem const* item : items) evaluation.streams.emplace_back(*item, options);
    TryAll(evaluation);
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
    command
        .add_option("--from", options->from,
                    "first time: seconds like 0.5 or 1/24, or frames like 12f (default: the frame of the first key)")
        ->type_name("TIME");
    command.add_option("--to", options->to, "last time (default: the frame of the last key)")->type_name("TIME");
    command.add_option("--fps", options->fps, "samples a second, like 24 or 30000/1001 (default: the keys' rate)")
        ->type_name("RATE");
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
