#include "cli/command.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/table.h"
#include "host/paths.h"

#include <fmt/format.h>

#include <iterator>

using kfshost::StreamItem;

namespace {

std::string Summary(kfshost::Scene const& scene, std::vector<StreamItem const*> const& items)
{
    std::size_t keys = 0;
    for (StreamItem const* item : items) keys += static_cast<std::size_t>(kfshost::KeyCount(*item->stream));
    std::string text =
        fmt::format("{}: {}, {}", scene.name, Plural(items.size(), "stream", "streams"), Plural(keys, "key", "keys"));
    if (auto const span = SpanOf(items))
        text += fmt::format(", {} s to {} s", TimeText(span->first), TimeText(span->last));
    text += fmt::format("\ntimes in 1/{} s: ", scene.timeScale);
    return text + (scene.exactTimes ? "every key time of the file is one of these, or the nearest float to one\n"
                                    : fmt::format("key times are rounded by up to {:.2g} s\n", scene.worstTimeError));
}

// What goes on between keys. Of a path the file's word is about its route; its keys tell whether they float.
std::string Interpolation(StreamItem const& item)
{
    std::string const name(NameOf(item.interpolation));
    if (!item.stream->IsSpatial()) return name;
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

int Run(Selection const& selection)
{
    kfshost::Scene const scene = LoadScene(selection);
    auto const items = SelectStreams(scene, selection);
    Table table({{"stream", Align::Left},
                 {"kind", Align::Left},
                 {"dimension", Align::Right},
                 {"components", Align::Left},
                 {"keys", Align::Right},
                 {"first", Align::Right},
                 {"last", Align::Right},
                 {"interpolation", Align::Left}});
    for (StreamItem const* item : items) {
        int const keys = kfshost::KeyCount(*item->stream);
        table.AddRow({item->path, std::string(NameOf(item->kind)), std::to_string(item->stream->GetDimension()),
                      Joined(item->components), std::to_string(keys),
                      keys == 0 ? "-" : TimeText(kfshost::KeyTime(*item->stream, 0)),
                      keys == 0 ? "-" : TimeText(kfshost::KeyTime(*item->stream, keys - 1)), Interpolation(*item)});
    }
    WriteToStandardOutput(Summary(scene, items) + '\n' + table.ToText());
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const selection = std::make_shared<Selection>();
    AddSelection(command, *selection);
    return [selection] { return Run(*selection); };
}

}  // namespace

Command const InfoCommand{"Look into files", "info", "List what is animated: streams, keys, span, interpolation",
                          Prepare};
