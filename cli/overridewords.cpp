#include "cli/overridewords.h"

#include "cli/errors.h"
#include "cli/output.h"
#include "host/dimensions.h"
#include "keystore/evaluate.h"

#include <boost/make_shared.hpp>
#include <fmt/format.h>
#include <fmt/ranges.h>

#include <charconv>
#include <cmath>
#include <string_view>
#include <unordered_map>

using kfshost::Scene;
using kfshost::StreamItem;

namespace {

using Numbers = std::vector<double>;

constexpr char const* ValueOption = "--override";
constexpr char const* FileOption = "--override-from";
constexpr int AllComponents = -1;

Numbers ParseNumbers(std::string const& word, std::string_view list)
{
    Numbers numbers;
    for (;;) {
        std::size_t const comma = std::min(list.find(','), list.size());
        std::string_view const text = list.substr(0, comma);
        double number = 0.0;
        auto const [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
        if (error != std::errc() || end != text.data() + text.size() || !std::isfinite(number))
            throw UserError(fmt::format("{} {}", ValueOption, word), fmt::format("\"{}\" isn't a number", text));
        numbers.push_back(number);
        if (comma == list.size()) return numbers;
        list.remove_prefix(comma + 1);
    }
}

boost::shared_ptr<KFS_StreamOverride> Fixed(KFS_Stream const& stream, Numbers numbers)
{
    return boost::make_shared<KFS_StreamOverride>(&stream, KFS_OverrideValue(std::move(numbers)), false);
}

std::string Count(StreamItem const& item)
{
    return fmt::format("{} ({})", Plural(item.components.size(), "component", "components"),
                       fmt::join(item.components, " "));
}

}  // namespace

void AddOverrideWords(CLI::App& command, OverrideWords& words)
{
    command
        .add_option(ValueOption, words.values,
                    "a value in place of what a stream, or all whose paths match, say at any time: a number for each "
                    "component; may be given again")
        ->allow_extra_args(false)
        ->type_name("PATH=N,N,...");
    command
        .add_option(FileOption, words.from,
                    "another file, whose streams are read in place of those with the same paths")
        ->type_name("FILE");
}

Overrides::Overrides(Scene const& scene, Selection const& selection, OverrideWords const& words)
{
    if (!words.from.empty()) TakeFrom(scene, selection, words.from);
    for (std::string const& word : words.values) TakeValues(scene, selection, word);
}

void Overrides::TakeValues(Scene const& scene, Selection const& selection, std::string const& word)
{
    std::size_t const equals = word.rfind('=');
    if (equals == std::string::npos || equals == 0)
        throw UserError(fmt::format("{} {}", ValueOption, word), "isn't a path and numbers like 'a/b/scale=1,1,1'");
    std::string const path = word.substr(0, equals);
    Numbers const numbers = ParseNumbers(word, std::string_view(word).substr(equals + 1));
    std::size_t matches = 0;
    for (StreamItem const& item : scene.streams) {
        if (!MatchesPath(item, path)) continue;
        ++matches;
        if (numbers.size() != item.components.size()) {
            throw UserError(
                fmt::format("{} {}", ValueOption, word),
                fmt::format("{}, but {} has {}", Plural(numbers.size(), "number", "numbers"), item.path, Count(item)));
        }
        auto const movers = kfshost::MoversOf(*item.stream);
        for (std::size_t i = 0; i < movers.size(); ++i)
            bag_.AddOverride(movers[i], Fixed(*movers[i], movers.size() == 1 ? numbers : Numbers{numbers[i]}));
    }
    if (matches == 0) {
        throw UserError(selection.ShownFile(),
                        fmt::format("{} {}: none of the {} streams has such a path (kfs info lists them)", ValueOption,
                                    path, scene.streams.size()));
    }
}

void Overrides::TakeFrom(Scene const& scene, Selection const& selection, std::string const& fileName)
{
    Selection other = selection;
    other.file = fileName;
    other.glob = "*";
    Scene const source = LoadScene(other);
    std::unordered_map<std::string, StreamItem const*> others;
    for (StreamItem const& item : source.streams) others.emplace(item.path, &item);
    std::size_t matches = 0;
    for (StreamItem const& item : scene.streams) {
        auto const found = others.find(item.path);
        if (found != others.end() && Follow(item, *found->second, fileName)) ++matches;
    }
    if (matches == 0)
        throw UserError(fmt::format("{} {}", FileOption, other.ShownFile()), "has no values for any of the streams");
    TellAbout(fileName, fmt::format("overrides {} of {}", matches, Plural(scene.streams.size(), "stream", "streams")));
}

// Whether there is anything to follow. A separated stream is followed through its components, which have paths of their
// own.
bool Overrides::Follow(StreamItem const& item, StreamItem const& other, std::string const& fileName)
{
    if (!kfshost::HasKeys(*other.stream)) return false;
    if (item.components.size() != other.components.size()) {
        throw UserError(fmt::format("{} {}", FileOption, kfshost::ShownFileName(fileName)),
                        fmt::format("{} has {} there and {} here", item.path, Count(other), Count(item)));
    }
    bool const isApart = kfshost::IsSeparated(*item.stream);
    if (!kfshost::IsSeparated(*other.stream)) {
        std::unique_ptr<KFS_StreamBase> copy(other.stream->Clone(true));
        sources_.emplace_back(copy.release()->GetAsLeaf());
    } else if (isApart) {
        return true;
    } else {
        kfshost::MoveNotes notes;
        try {
            sources_.push_back(kfshost::JoinedCopy(*other.stream, &notes));
        } catch (kfshost::DimensionsError const& error) {
            throw UserError(other.path, error.what());
        }
        if (notes.IsOff()) {
            throw UserError(fmt::format("{} {}", FileOption, kfshost::ShownFileName(fileName)),
                            item.path + " is separated there, into curves that no single stream has: kfs separate "
                                        "makes this one alike");
        }
    }
    KFS_Stream const& source = *sources_.back();
    auto const movers = kfshost::MoversOf(*item.stream);
    for (std::size_t i = 0; i < movers.size(); ++i)
        Put(*movers[i], source, isApart ? static_cast<int>(i) : AllComponents);
    return true;
}

// Reads the source whenever the stream is read; an identity looks at the source's keys.
void Overrides::Put(KFS_Stream const& stream, KFS_Stream const& source, int component)
{
    auto const read = [&source, component](T_Time const& time, KFS_OverrideValue& value) {
        Numbers numbers(static_cast<std::size_t>(source.GetDimension()));
        if (int const code = KFS_GetValueFPlus(&source, &time, 0, numbers.data(), nullptr, nullptr)) throw int{code};
        if (component != AllComponents) numbers = {numbers[static_cast<std::size_t>(component)]};
        value = std::move(numbers);
    };
    bag_.AddOverride(&stream, boost::make_shared<KFS_StreamOverride>(&stream, KFS_OverrideValue(Numbers()), &source,
                                                                     T_Time{0, source.GetTimeScale()}, read,
                                                                     hearth::utility::Guid(), false));
}
