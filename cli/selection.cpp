#include "cli/selection.h"

#include "cli/errors.h"
#include "cli/expressions.h"
#include "host/dimensions.h"
#include "host/import.h"
#include "host/paths.h"
#include "host/projectfile.h"
#include "host/storeerror.h"
#include "overrides/streamexpression.h"

#include <fmt/format.h>

#include <algorithm>

#include <fnmatch.h>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

void HoldAsPath(StreamItem& item, Selection const& selection)
{
    if (kfshost::IsSeparated(*item.stream)) {  // a path has no use for dimensions of their own
        try {
            item.stream = kfshost::JoinedCopy(*item.stream);
        } catch (kfshost::DimensionsError const& error) {
            throw UserError(selection.ShownFile() + ": " + item.path, error.what());
        }
    }
    if (kfshost::KeyCount(*item.stream) > kfshost::MaxPathKeys) {
        throw UserError(selection.ShownFile() + ": " + item.path,
                        fmt::format("has more than {} keys, too many for a path", kfshost::MaxPathKeys));
    }
    if (selection.roving && item.interpolation == kfshost::SourceInterpolation::Step) {
        throw UserError(selection.ShownFile() + ": " + item.path,
                        "steps from key to key, so there is no way on which keys could rove");
    }
    if (HasActiveExpression(item)) {
        throw UserError(
            selection.ShownFile() + ": " + item.path,
            "has an expression, which no path through its keys stands for (--no-expressions takes the keys)");
    }
    if (!item.stream->IsSpatial() && !item.stream->HasNoKeys())  // a project may hold it as a path already
        item.stream = kfshost::MakePath(item);
    if (selection.roving) kfshost::LetInnerKeysFloat(*item.stream);
}

// Makes paths of those of the selected streams that are positions.
void HoldAsPaths(kfshost::Scene& scene, Selection const& selection)
{
    std::size_t const selected = SelectStreams(scene, selection).size();
    bool any = false;
    for (StreamItem& item : scene.streams) {
        if (MatchesPath(item, selection.glob) && kfshost::IsPosition(item)) {
            HoldAsPath(item, selection);
            any = true;
        }
    }
    if (!any) {
        throw UserError(
            selection.ShownFile(),
            selected == 1 ? "the chosen stream isn't a position in 2 or 3 dimensions"
                          : fmt::format("none of the {} chosen streams is a position in 2 or 3 dimensions", selected));
    }
}

// The file is read once, since it may be a pipe.
kfshost::Scene ReadScene(Selection const& selection)
{
    kfshost::FileInput const input = kfshost::ReadInput(selection.file);
    if (input.kind != kfshost::FileKind::Project)
        return kfshost::ImportFile(input, {.timeScale = selection.timeScale, .arcTolerance = 0.0});
    if (selection.timeScale != 0) throw UserError("--time-scale", "a project has the times with which it was imported");
    kfshost::LoadNotes notes;
    kfshost::Scene scene = kfshost::TakeScene(kfshost::LoadProject(input, &notes));
    if (selection.forSaving && !notes.reports.empty())
        throw kfshost::ImportError("", notes.reports.front() + " (kfs save-as --repair saves what is left)");
    TellChanges(selection.file, notes);
    return scene;
}

// In memory alone: a command that saves doesn't have the option.
void SwitchExpressionsOff(kfshost::Scene& scene)
{
    for (StreamItem& item : scene.streams) {
        if (!item.stream->HasExpression()) continue;
        kfshost::ThrowIfFailed(KFS_SetStreamExprFlags(item.stream.get(), KFS_ExprFlag_Disabled, KFS_ExprFlag_Disabled));
    }
}

}  // namespace

std::string Selection::ShownFile() const
{
    return kfshost::ShownFileName(file);
}

bool MatchesPath(StreamItem const& item, std::string const& pattern)
{
    return item.path == pattern || fnmatch(pattern.c_str(), item.path.c_str(), 0) == 0;
}

std::vector<StreamItem const*> SelectStreams(kfshost::Scene const& scene, Selection const& selection)
{
    std::vector<StreamItem const*> items;
    for (StreamItem const& item : scene.streams)
        if (MatchesPath(item, selection.glob)) items.push_back(&item);
    if (scene.streams.empty()) throw UserError(selection.ShownFile(), "nothing is animated");
    if (items.empty()) {
        throw UserError(selection.ShownFile(),
                        fmt::format("--stream {}: none of the {} streams has such a path (kfs info lists them)",
                                    selection.glob, scene.streams.size()));
    }
    return items;
}

kfshost::Scene LoadScene(Selection const& selection)
{
    if (selection.roving && !selection.asPaths)
        throw UserError("--rove", "only paths have keys that can float: add --as spatial");
    return ReadingFile(selection.file, [&] {
        kfshost::Scene scene = ReadScene(selection);
        if (selection.noExpressions) SwitchExpressionsOff(scene);
        if (selection.asPaths) HoldAsPaths(scene, selection);
        return scene;
    });
}

kfshost::Scene LoadSceneInTree(Selection const& selection)
{
    kfshost::Scene scene = LoadScene(selection);
    if (scene.tree && !selection.asPaths) return scene;
    return ReadingFile(selection.file, [&] { return kfshost::TakeScene(kfshost::MakeTree(std::move(scene))); });
}

std::optional<TimeSpan> SpanOf(std::vector<StreamItem const*> const& items)
{
    std::optional<TimeSpan> span;
    for (StreamItem const* item : items) {
        for (KFS_Stream const* stream : kfshost::MoversOf(*item->stream)) {
            int const keys = kfshost::KeyCount(*stream);
            bool const isStill = keys < 0 && kfshost::IsSeparated(*item->stream);
            if (keys == 0 || isStill) continue;
            TimeSpan const own{kfshost::KeyTime(*stream, 0), kfshost::KeyTime(*stream, keys - 1)};
            span = span ? TimeSpan{std::min(span->first, own.first), std::max(span->last, own.last)} : own;
        }
    }
    return span;
}

std::string TimeText(Rational const& time)
{
    constexpr int frameUnits = 120000;  // whole numbers of these are the frames of the usual rates
    return frameUnits % time.Denominator() == 0 ? time.ToString() : fmt::format("{}", time.ToDouble());
}
