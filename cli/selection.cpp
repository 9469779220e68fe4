#include "cli/selection.h"

#include "cli/usererror.h"

#include <fmt/format.h>

#include <algorithm>

#include <fnmatch.h>

using kfshost::Rational;
using kfshost::StreamItem;

std::vector<StreamItem const*> SelectStreams(kfshost::Scene const& scene, Selection const& selection)
{
    std::vector<StreamItem const*> items;
    for (StreamItem const& item : scene.streams) {
        if (fnmatch(selection.glob.c_str(), item.path.c_str(), 0) == 0) {
            items.push_back(&item);
        }
    }
    if (scene.streams.empty()) {
        throw UserError(selection.file, "nothing is animated");
    }
    if (items.empty()) {
        throw UserError(selection.file,
                        fmt::format("--stream {}: none of the {} streams has such a path (kfs info lists them)",
                                    selection.glob, scene.streams.size()));
    }
    return items;
}

std::optional<TimeSpan> SpanOf(std::vector<StreamItem const*> const& items)
{
    std::optional<TimeSpan> span;
    for (StreamItem const* item : items) {
        int const keys = kfshost::KeyCount(*item->stream);
        if (keys == 0) {
            continue;
        }
        TimeSpan const own{kfshost::KeyTime(*item->stream, 0), kfshost::KeyTime(*item->stream, keys - 1)};
        span = span ? TimeSpan{std::min(span->first, own.first), std::max(span->last, own.last)} : own;
    }
    return span;
}

std::string TimeText(Rational const& time)
{
    constexpr int frameUnits = 120000;  // whole numbers of these are the frames of the usual rates
    return frameUnits % time.Denominator() == 0 ? time.ToString() : fmt::format("{}", time.ToDouble());
}
