#include "cli/command.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/sampletimes.h"
#include "cli/selection.h"
#include "cli/table.h"
#include "host/polyline.h"

#include <fmt/format.h>

#include <limits>

using kfshost::PolylinePoint;
using kfshost::Rational;
using kfshost::StreamItem;

namespace {

enum class Format { Table, Csv, Json };

struct Options {
    Selection selection;
    std::string from;  // empty: the first key of all
    std::string to;    // empty: the last
    double tolerance = 0.001;
    Format format = Format::Table;
};

struct Line {
    StreamItem const* item;
    std::string const* component;
    std::vector<PolylinePoint> points;
};

// The curve of one component, which has a stream of its own where dimensions are separated.
Line LineOf(StreamItem const& item, std::size_t component, TimeSpan const& part, Options const& options)
{
    auto const movers = kfshost::MoversOf(*item.stream);
    bool const isApart = kfshost::IsSeparated(*item.stream);
    KFS_Stream const& stream = isApart ? *movers[component] : *item.stream;
    if (stream.IsSpatial() && !stream.HasNoKeys()) {
        throw UserError(item.path, "is a path, whose components have no curves between keys (kfs separate gives it "
                                   "some, and kfs eval reads it)");
    }
    try {
        return {&item, &item.components[component],
                kfshost::SamplePolyline(stream, isApart ? 0 : static_cast<int>(component), part.first, part.last,
                                        options.tolerance)};
    } catch (kfshost::PolylineError const& error) {
        throw UserError("--tolerance", error.what());
    }
}

TimeSpan PartOf(std::vector<StreamItem const*> const& items, Options const& options)
{
    bool const inFrames = options.from.ends_with('f') || options.to.ends_with('f');
    Rational const fps = inFrames ? FindFps(items, options.selection) : Rational(1, 1);
    TimeSpan part = SpanOf(items).value_or(TimeSpan{});
    if (!options.from.empty()) part.first = ParseTime(options.from, "--from", fps);
    if (!options.to.empty()) part.last = ParseTime(options.to, "--to", fps);
    if (part.last < part.first) {
        throw UserError(options.to.empty() ? "--from" : "--to",
                        fmt::format("nothing is from {} s to {} s", TimeText(part.first), TimeText(part.last)));
    }
    return part;
}

void WriteTable(Line const& line, Output& output)
{
    Table table({{"seconds", Align::Right}, {"value", Align::Right}});
    for (PolylinePoint const& point : line.points)
        table.AddRow({fmt::format("{}", point.seconds), fmt::format("{}", point.value)});
    output.Add(line.item->path + '.' + *line.component + '\n' + (line.points.empty() ? "no keys\n" : table.ToText()));
}

void Write(std::vector<Line> const& lines, Options const& options, Output& output)
{
    if (options.format == Format::Csv) output.Add("stream,component,seconds,value\n");
    if (options.format == Format::Json) output.Add(fmt::format(R"({{"tolerance":{},"lines":[)", options.tolerance));
    for (Line const& line : lines) {
        bool const isFirst = &line == lines.data();
        if (options.format == Format::Table) {
            output.Add(isFirst ? "" : "\n");
            WriteTable(line, output);
        } else if (options.format == Format::Csv) {
            std::string const name = CsvCell(line.item->path) + ',' + CsvCell(*line.component);
            for (PolylinePoint const& point : line.points)
                output.Add(fmt::format("{},{},{}\n", name, point.seconds, point.value));
        } else {
            output.Add(fmt::format("{}{{\"stream\":{},\"component\":{},\"points\":[", isFirst ? "\n" : ",\n",
                                   Quoted(line.item->path), Quoted(*line.component)));
            for (PolylinePoint const& point : line.points)
                output.Add(
                    fmt::format("{}[{},{}]", &point == line.points.data() ? "" : ",", point.seconds, point.value));
            output.Add("]}");
        }
    }
    if (options.format == Format::Json) output.Add("]}\n");
    output.Flush();
}

int Run(Options const& options)
{
    if (!(options.tolerance > 0.0))
        throw UserError("--tolerance", "has to be more than 0, which no line has of a curve");
    kfshost::Scene const scene = LoadScene(options.selection);
    auto const items = SelectStreams(scene, options.selection);
    TimeSpan const part = PartOf(items, options);
    std::vector<Line> lines;
    for (StreamItem const* item : items)
        for (std::size_t c = 0; c < item->components.size(); ++c) lines.push_back(LineOf(*item, c, part, options));
    Output output;
    Write(lines, options, output);
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
                    "first time: seconds like 0.5 or 1/24, or frames like 12f (default: the first key)")
        ->type_name("TIME");
    command.add_option("--to", options->to, "last time (default: the last key)")->type_name("TIME");
    command
        .add_option("--tolerance", options->tolerance,
                    "how far the line may be from the curve, in the stream's units (default: 0.001)")
        ->check(NumberCheck(0.0, std::numeric_limits<double>::max()))
        ->type_name("T");
    command
        .add_option_function<std::string>(
            "--format", [options](std::string const& name) { options->format = FormatNamed(name); },
            "how to print (default: table)")
        ->check(CLI::IsMember({"table", "csv", "json"}))
        ->type_name("FORMAT");
    command.footer("A line through as few points as the tolerance allows for each component. Before the first point "
                   "and behind the\n"
                   "last one their values hold; a jump is two points at one time, of which the second holds from there "
                   "on. Rotations\n"
                   "are as they are stored (kfs eval --raw).");
    return [options] { return Run(*options); };
}

}  // namespace

Command const SampleCommand{"Look into files", "sample", "Print curves as lines with as few points as they need",
                            Prepare};
