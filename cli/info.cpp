#include "cli/command.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/table.h"
#include "frame/services/strings.h"
#include "host/channelstream.h"
#include "host/framegrid.h"
#include "host/paths.h"
#include "host/timescale.h"

#include <fmt/format.h>

#include <algorithm>
#include <iterator>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// Seconds for people, and where that isn't all the exact fraction behind.
std::string SecondsText(Rational const& time)
{
    std::string text = fmt::format("{:.3f}", time.ToDouble());
    text.erase(text.find_last_not_of('0') + 1);
    if (text.ends_with('.')) text.pop_back();
    bool const isAll = Rational::Parse(text) == time;
    return isAll ? text : fmt::format("{} ({})", text, time.ToString());
}

std::string TimesText(kfshost::Scene const& scene)
{
    std::string const times = fmt::format("times in 1/{} s: ", scene.timeScale);
    if (!scene.exactTimes)
        return times + fmt::format("keys are up to {:.2g} s from the file's times\n", scene.worstTimeError);
    return times +
           fmt::format("every key time of the file is one of these, to {} units in the last place of its float\n",
                       kfshost::FrameTolerance);
}

std::string FramesText(std::vector<StreamItem const*> const& items)
{
    kfshost::FrameGrid const grid = kfshost::FindFrameGrid(items);
    std::string const frames = fmt::format("frames of {} a second", grid.rate.ToString());
    if (grid.times == 0) return "";
    if (grid.offGrid == 0) return "all keys are on " + frames + '\n';
    return fmt::format("{} of {} aren't on {}, but up to {:.2g} of a frame beside them\n", grid.offGrid,
                       Plural(grid.times, "key time", "key times"), frames, grid.worst);
}

std::string Summary(kfshost::Scene const& scene, std::vector<StreamItem const*> const& items)
{
    std::size_t keys = 0;
    for (StreamItem const* item : items)
        keys += static_cast<std::size_t>(std::max(kfshost::KeyCount(*item->stream), 0));
    std::string text =
        fmt::format("{}: {}, {}", scene.name, Plural(items.size(), "stream", "streams"), Plural(keys, "key", "keys"));
    if (auto const span = SpanOf(items))
        text += fmt::format(", {} s to {} s", SecondsText(span->first), SecondsText(span->last));
    return text + '\n' + TimesText(scene) + FramesText(items);
}

// What goes on between keys. Of a path the file's word is about its route; its keys tell whether they float.
std::string Interpolation(StreamItem const& item)
{
    std::string name(NameOf(item.interpolation));
    if (!item.stream->IsSpatial() || kfshost::IsSeparated(*item.stream)) return name;
    std::size_t const floating = kfshost::FloatKeyCount(*item.stream);
    return name + (floating == 0 ? " path" : fmt::format(" path, {}", Plural(floating, "float key", "float keys")));
}

std::string Joined(std::vector<std::string> const& names)
{
    constexpr std::size_t mostNames = 6;
    std::string text;
    for (std::size_t i = 0; i < names.size() && i < mostNames; ++i) text += (i == 0 ? "" : " ") + names[i];
    return names.size() > mostNames ? text + " ..." : text;
}

std::string UnitsOf(KFS_Stream const& stream)
{
    std::string const name = Q_UTF16ToMBString(stream.GetUnitsName());
    return name.empty() ? "-" : name;
}

// What an editor offers; a file may have values beyond.
std::string LimitsOf(KFS_Stream const& stream)
{
    if (!stream.HasMinValue() && !stream.HasMaxValue()) return "-";
    return (stream.HasMinValue() ? fmt::format("{} ", stream.GetMinValue()) : "") + "to" +
           (stream.HasMaxValue() ? fmt::format(" {}", stream.GetMaxValue()) : "");
}

std::string DefaultOf(KFS_Stream const& stream)
{
    std::vector<std::string> numbers;
    if (auto const* const channel = dynamic_cast<kfshost::ChannelStream const*>(&stream))
        for (double const number : channel->GetDefaultValue()) numbers.push_back(fmt::format("{}", number));
    else
        numbers.push_back(fmt::format("{}", stream.GetDefaultVector4()[0]));
    return Joined(numbers);
}

// Whether each component has a stream of its own.
std::string SeparationOf(StreamItem const& item)
{
    if (kfshost::IsFollower(item)) return "dimension";
    if (kfshost::IsSeparated(*item.stream)) return "yes";
    return item.stream->IsSeparationLeader() ? "no" : "-";
}

// What computes the value; its first line says enough to know it again.
std::string ExpressionOf(KFS_Stream const& stream)
{
    constexpr std::size_t most = 40;
    if (!stream.HasExpression()) return "-";
    std::string const text = Q_UTF16ToMBString(stream.GetExpression());
    std::string line = Shown(text.substr(0, text.find('\n')));
    if (line.size() > most) line = Shown(text.substr(0, most));
    return line + (line.size() < text.size() ? " ..." : "") + (stream.HasEnabledExpression() ? "" : " (off)");
}

std::vector<std::string> RowOf(StreamItem const& item, bool withExpression)
{
    auto const span = SpanOf({&item});
    std::vector<std::string> row{item.path,
                                 std::string(NameOf(item.kind)),
                                 std::to_string(item.stream->GetDimension()),
                                 Joined(item.components),
                                 UnitsOf(*item.stream),
                                 LimitsOf(*item.stream),
                                 DefaultOf(*item.stream),
                                 SeparationOf(item),
                                 item.stream->HasNoKeys() ? "-" : std::to_string(kfshost::KeyCount(*item.stream)),
                                 span ? SecondsText(span->first) : "-",
                                 span ? SecondsText(span->last) : "-",
                                 Interpolation(item)};
    if (withExpression) row.push_back(ExpressionOf(*item.stream));
    return row;
}

int Run(Selection const& selection)
{
    kfshost::Scene const scene = LoadScene(selection);
    auto const items = SelectStreams(scene, selection);
    bool const anyExpression =
        std::ranges::any_of(items, [](StreamItem const* item) { return item->stream->HasExpression(); });
    std::vector<Column> columns{
        {"stream", Align::Left}, {"kind", Align::Left},   {"dimension", Align::Right}, {"components", Align::Left},
        {"units", Align::Left},  {"limits", Align::Left}, {"default", Align::Left},    {"separated", Align::Left},
        {"keys", Align::Right},  {"first", Align::Right}, {"last", Align::Right},      {"interpolation", Align::Left}};
    if (anyExpression) columns.push_back({"expression", Align::Left});
    Table table(std::move(columns));
    for (StreamItem const* item : items) table.AddRow(RowOf(*item, anyExpression));
    WriteToStandardOutput(Summary(scene, items) + '\n' + table.ToText());
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const selection = std::make_shared<Selection>();
    AddSelection(command, *selection);
    command.footer(
        "Limits are what an editor offers; values of a file may lie beyond. Separated: whether each component has a\n"
        "stream of its own, which is listed below it; - where it can't have.");
    return [selection] { return Run(*selection); };
}

}  // namespace

Command const InfoCommand{"Look into files", "info",
                          "List what is animated: streams, their units, limits and defaults, keys, span, interpolation",
                          Prepare};
