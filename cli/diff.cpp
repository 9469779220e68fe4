#include "cli/command.h"
#include "cli/output.h"
#include "cli/selection.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"

#include <fmt/format.h>
#include <fmt/ranges.h>

#include <unordered_map>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// What is said of one side, and what of the other.
std::string Against(std::string const& before, std::string const& after)
{
    return before == after ? "" : before + " | " + after;
}

std::string With(std::string const& place, std::string const& difference)
{
    return difference.empty() ? "" : place + ": " + difference;
}

std::string Shape(StreamItem const& item)
{
    KFS_Stream const& stream = *item.stream;
    std::string const form = stream.IsSpatial() ? "path" : "curves";
    return fmt::format("{} of {}", form, fmt::join(item.components, " ")) + (stream.HasNoKeys() ? ", constant" : "");
}

std::string KeyText(KFS_Stream const& stream, int index)
{
    std::vector<double> value(static_cast<std::size_t>(stream.GetDimension()));
    char inInterp = 0;
    char outInterp = 0;
    kfshost::ThrowIfFailed(KFS_GetKeyF(&stream, index, value.data(), &inInterp, &outInterp));
    return fmt::format("{} ({}/{})", fmt::join(value, " "), static_cast<int>(inInterp), static_cast<int>(outInterp));
}

std::string ValueText(KFS_Stream const& stream, Rational const& time)
{
    std::vector<double> value(static_cast<std::size_t>(stream.GetDimension()));
    kfshost::ReadAt(stream, time, value.data());
    return fmt::format("{}", fmt::join(value, " "));
}

// Keys with their times, and halfway between keys the values, which depend on the handles.
std::string FirstDifferenceOfKeys(KFS_Stream const& before, KFS_Stream const& after)
{
    int const count = kfshost::KeyCount(before);
    for (int i = 0; i < count; ++i) {
        Rational const time = kfshost::KeyTime(before, i);
        std::string const key = fmt::format("key {}", i);
        std::string text = With(key, Against(TimeText(time) + " s", TimeText(kfshost::KeyTime(after, i)) + " s"));
        if (text.empty())
            text = With(key + " at " + TimeText(time) + " s", Against(KeyText(before, i), KeyText(after, i)));
        if (text.empty() && i > 0) {
            Rational const middle = (kfshost::KeyTime(before, i - 1) + time) * Rational(1, 2);
            text = With("between keys at " + TimeText(middle) + " s",
                        Against(ValueText(before, middle), ValueText(after, middle)));
        }
        if (!text.empty()) return text;
    }
    return "";
}

std::string FirstDifference(StreamItem const& before, StreamItem const& after)
{
    std::string text = Against(Shape(before), Shape(after));
    if (text.empty()) {
        text = Against(fmt::format("{} keys", kfshost::KeyCount(*before.stream)),
                       fmt::format("{} keys", kfshost::KeyCount(*after.stream)));
    }
    if (text.empty() && before.stream->HasNoKeys())
        text = Against(ValueText(*before.stream, Rational(0, 1)), ValueText(*after.stream, Rational(0, 1)));
    return text.empty() ? FirstDifferenceOfKeys(*before.stream, *after.stream) : text;
}

// What differs between two scenes, a line for each stream. Times are compared as times, whatever their scale.
std::string DifferencesOf(kfshost::Scene const& before, kfshost::Scene const& after)
{
    std::unordered_map<std::string, StreamItem const*> others;
    for (StreamItem const& item : after.streams) others.emplace(item.path, &item);
    std::string text;
    for (StreamItem const& item : before.streams) {
        auto const other = others.extract(item.path);
        std::string const difference = other ? FirstDifference(item, *other.mapped()) : "";
        if (!other)
            text += "- " + item.path + '\n';
        else if (!difference.empty())
            text += "~ " + item.path + ": " + difference + '\n';
    }
    for (StreamItem const& item : after.streams)
        if (others.contains(item.path)) text += "+ " + item.path + '\n';
    return text;
}

struct Options {
    Selection before;
    Selection after;
};

int Run(Options const& options)
{
    std::string const text = DifferencesOf(LoadScene(options.before), LoadScene(options.after));
    WriteToStandardOutput(text);
    return text.empty() ? ExitDone : ExitFound;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    command.add_option("BEFORE", options->before.file, "a project, or a .gltf, .glb or .bvh file")->required();
    command.add_option("AFTER", options->after.file, "another one")->required();
    command.footer(
        "A line for each stream that differs: - only in BEFORE, + only in AFTER, ~ in both, with what differs first.\n"
        "Keys show their values and, like (2/1), how the curve comes in and goes out: 1 linear, 2 spline, 3 hold.\n"
        "The exit code is 0 if nothing differs and 1 if something does.");
    return [options] { return Run(*options); };
}

}  // namespace

Command const DiffCommand{"Look into files", "diff", "Tell how the streams of two files differ", Prepare};
