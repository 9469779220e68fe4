#include "cli/command.h"
#include "cli/output.h"
#include "cli/selection.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"

#include <fmt/format.h>
#include <fmt/ranges.h>

#include <cstring>
#include <unordered_map>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// What is said of one side, and what of the other.
std::string Against(std::string const& before, std::string const& after)
{
    return before == after ? "" : before + " | " + after;
}

std::string Shape(StreamItem const& item)
{
    KFS_Stream const& stream = *item.stream;
    std::string const form = stream.IsSpatial() ? "path" : "curves";
    return fmt::format("{} of {}", form, fmt::join(item.components, " ")) + (kfshost::IsSeparated(stream)
                                                                                 ? ", separated"
                                                                             : stream.HasNoKeys() ? ", constant"
                                                                                                  : "");
}

// A key without its time.
struct Key {
    std::vector<double> value;
    char in = 0;
    char out = 0;
};

// As bits, so that -0 isn't 0: what the texts show must differ where this does.
bool Same(std::vector<double> const& a, std::vector<double> const& b)
{
    return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof(double)) == 0;
}

std::string_view NameOfInterp(char code)
{
    switch (code) {
    case KFS_Interp_Linear: return "linear";
    case KFS_Interp_Spline: return "spline";
    case KFS_Interp_Hold: return "hold";
    default: return "undecided";
    }
}

// One of the two streams, with room for what is read of it: keys are many, and texts are made of those alone that
// differ.
class Side {
public:
    explicit Side(KFS_Stream const& stream) : stream_(stream)
    {
        key_.value.resize(static_cast<std::size_t>(stream.GetDimension()));
        value_ = key_.value;
    }

    Rational Time(int index) const { return kfshost::KeyTime(stream_, index); }
    Key const& KeyAt(int index)
    {
        kfshost::ThrowIfFailed(KFS_GetKeyF(&stream_, index, key_.value.data(), &key_.in, &key_.out));
        return key_;
    }
    std::vector<double> const& ValueAt(Rational const& time)
    {
        kfshost::ReadAt(stream_, time, value_.data());
        return value_;
    }
    std::string KeyText() const
    {
        return fmt::format("{} ({}/{})", fmt::join(key_.value, " "), NameOfInterp(key_.in), NameOfInterp(key_.out));
    }
    std::string ValueText() const { return fmt::format("{}", fmt::join(value_, " ")); }

private:
    KFS_Stream const& stream_;
    Key key_;
    std::vector<double> value_;
};

// Keys with their times, and halfway between keys the values, which depend on the handles.
std::string FirstDifferenceOfKeys(KFS_Stream const& before, KFS_Stream const& after)
{
    Side left(before);
    Side right(after);
    int const count = kfshost::KeyCount(before);
    Rational timeBefore;
    for (int i = 0; i < count; ++i) {
        Rational const time = left.Time(i);
        Rational const otherTime = right.Time(i);
        if (time != otherTime) return fmt::format("key {}: {} s | {} s", i, TimeText(time), TimeText(otherTime));
        Key const& key = left.KeyAt(i);
        Key const& other = right.KeyAt(i);
        if (key.in != other.in || key.out != other.out || !Same(key.value, other.value))
            return fmt::format("key {} at {} s: {} | {}", i, TimeText(time), left.KeyText(), right.KeyText());
        if (i > 0) {
            Rational const middle = (timeBefore + time) * Rational(1, 2);
            if (!Same(left.ValueAt(middle), right.ValueAt(middle)))
                return fmt::format("between keys at {} s: {} | {}", TimeText(middle), left.ValueText(),
                                   right.ValueText());
        }
        timeBefore = time;
    }
    return "";
}

std::string ConstantText(KFS_Stream const& stream)
{
    Side side(stream);
    side.ValueAt(Rational());
    return side.ValueText();
}

std::string Keys(KFS_Stream const& stream)
{
    return Plural(static_cast<std::size_t>(kfshost::KeyCount(stream)), "key", "keys");
}

std::string FirstDifference(StreamItem const& before, StreamItem const& after)
{
    std::string text = Against(Shape(before), Shape(after));
    if (text.empty() && kfshost::IsSeparated(*before.stream)) return "";  // the components are told by themselves
    if (text.empty()) text = Against(Keys(*before.stream), Keys(*after.stream));
    if (text.empty() && before.stream->HasNoKeys())
        text = Against(ConstantText(*before.stream), ConstantText(*after.stream));
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
            text += "- " + Shown(item.path) + '\n';
        else if (!difference.empty())
            text += "~ " + Shown(item.path) + ": " + difference + '\n';
    }
    for (StreamItem const& item : after.streams)
        if (others.contains(item.path)) text += "+ " + Shown(item.path) + '\n';
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
        "Keys show their values and, like (spline/linear), how the curve comes in and goes out.\n"
        "The exit code is 0 if nothing differs and 1 if something does.");
    return [options] { return Run(*options); };
}

}  // namespace

Command const DiffCommand{"Look into files", "diff", "Tell how the streams of two files differ", Prepare};
