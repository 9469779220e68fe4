#include "host/bvh_parse_private.h"

#include "host/import_error.h"
#include "host/names.h"
#include "host/timescale.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>

namespace kfshost {

namespace {

constexpr std::array<std::string_view, 6> ChannelNames{"Xposition", "Yposition", "Zposition",
                                                       "Xrotation", "Yrotation", "Zrotation"};
constexpr std::string_view Blanks = " \t\r\n\v\f";

// Hands out the words of a text and knows on which line it is.
class Words {
public:
    explicit Words(std::string_view text) : rest_(text)
    {
        constexpr std::string_view byteOrderMark = "\xEF\xBB\xBF";
        if (rest_.starts_with(byteOrderMark)) rest_.remove_prefix(byteOrderMark.size());
    }

    bool AtEnd()
    {
        SkipBlanks();
        return rest_.empty();
    }

    std::string_view Next(std::string_view wanted)
    {
        if (AtEnd()) throw ImportError(Place(), "the file ends where " + std::string(wanted) + " should be");
        std::string_view const word = rest_.substr(0, rest_.find_first_of(Blanks));
        rest_.remove_prefix(word.size());
        return word;
    }

    // A name may have blanks in it: what is left of the line.
    std::string_view RestOfLine()
    {
        std::string_view line = rest_.substr(0, rest_.find('\n'));
        rest_.remove_prefix(line.size());
        while (!line.empty() && Blanks.find(line.front()) != std::string_view::npos) line.remove_prefix(1);
        while (!line.empty() && Blanks.find(line.back()) != std::string_view::npos) line.remove_suffix(1);
        return line;
    }

    void Expect(std::string_view wanted)
    {
        if (std::string_view const word = Next(wanted); word != wanted)
            throw ImportError(Place(), '"' + Shown(word) + "\" stands where " + std::string(wanted) + " should be");
    }

    double NextNumber(char const* wanted)
    {
        std::string_view word = Next(wanted);
        word.remove_prefix(word.starts_with('+') ? 1 : 0);
        double number = 0.0;
        auto const [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
        if (error != std::errc() || end != word.data() + word.size() || !std::isfinite(number))
            throw ImportError(Place(), '"' + Shown(word) + "\" isn't " + wanted);
        return number;
    }

    std::size_t NextCount(char const* wanted)
    {
        std::string_view const word = Next(wanted);
        std::size_t count = 0;
        auto const [end, error] = std::from_chars(word.data(), word.data() + word.size(), count);
        if (error != std::errc() || end != word.data() + word.size())
            throw ImportError(Place(), '"' + Shown(word) + "\" isn't " + wanted);
        return count;
    }

    std::size_t BytesLeft() const { return rest_.size(); }
    std::string Place() const { return "line " + std::to_string(line_); }

    static std::string Shown(std::string_view word) { return CleanName(word.substr(0, 40)); }

private:
    void SkipBlanks()
    {
        std::size_t const skipped = std::min(rest_.find_first_not_of(Blanks), rest_.size());
        line_ += std::ranges::count(rest_.substr(0, skipped), '\n');
        rest_.remove_prefix(skipped);
    }

    std::string_view rest_;
    std::ptrdiff_t line_ = 1;
};

class BvhParser {
public:
    explicit BvhParser(std::string_view text) : words_(text) {}

    BvhMotion Run()
    {
        words_.Expect("HIERARCHY");
        words_.Expect("ROOT");
        OpenJoint();
        while (depth_ > 0) ParseMember();
        ParseMotion();
        return std::move(motion_);
    }

private:
    void OpenJoint()
    {
        BvhJoint joint;
        joint.name = CleanName(words_.RestOfLine());
        if (joint.name.empty()) throw ImportError(words_.Place(), "a joint has no name");
        motion_.joints.push_back(std::move(joint));
        words_.Expect("{");
        ++depth_;
    }

    // One statement inside a joint. Channels belong to the joint opened last: they come before its children.
    void ParseMember()
    {
        std::string_view const word = words_.Next("a joint's member");
        if (word == "OFFSET") {
            ParseOffset();
        } else if (word == "CHANNELS") {
            ParseChannels();
        } else if (word == "JOINT") {
            OpenJoint();
        } else if (word == "End") {
            words_.Expect("Site");
            words_.Expect("{");
            words_.Expect("OFFSET");
            ParseOffset();
            words_.Expect("}");
        } else if (word == "}") {
            --depth_;
        } else {
            throw ImportError(words_.Place(), '"' + Words::Shown(word) + "\" isn't a member of a joint");
        }
    }

    void ParseOffset()
    {
        for (int axis = 0; axis < 3; ++axis) words_.NextNumber("a number of an offset");
    }

    void ParseChannels()
    {
        std::size_t const count = words_.NextCount("a count of channels");
        BvhJoint& joint = motion_.joints.back();
        if (!joint.channels.empty() || count > ChannelNames.size())
            throw ImportError(words_.Place(), "a joint has up to six channels, given once");
        for (std::size_t i = 0; i < count; ++i) {
            std::string const name(words_.Next("a channel's name"));
            if (std::ranges::find(ChannelNames, name) == ChannelNames.end() ||
                std::ranges::find(joint.channels, name) != joint.channels.end())
                throw ImportError(words_.Place(), '"' + Words::Shown(name) + "\" isn't a channel, or is given twice");
            joint.channels.push_back(name);
        }
        motion_.channelCount += count;
    }

    void ParseMotion()
    {
        words_.Expect("MOTION");
        words_.Expect("Frames:");
        motion_.frames = words_.NextCount("a count of frames");
        words_.Expect("Frame");
        words_.Expect("Time:");
        std::string_view const time = words_.Next("the frame time");
        auto const frameTime = ParseFrameTime(time);
        if (!frameTime)
            throw ImportError(words_.Place(), '"' + Words::Shown(time) + "\" isn't a frame time in seconds");
        motion_.frameTime = *frameTime;
        ParseFrames();
    }

    // A number takes a digit and a blank at least: what can't be there isn't made room for.
    void ParseFrames()
    {
        if (motion_.channelCount == 0) throw ImportError(words_.Place(), "no joint has a channel");
        std::size_t const mostNumbers = words_.BytesLeft() / 2;
        if (motion_.frames > mostNumbers / motion_.channelCount) {
            throw ImportError(words_.Place(), "the file is too short for " + std::to_string(motion_.frames) +
                                                  " frames of " + std::to_string(motion_.channelCount) + " channels");
        }
        motion_.numbers.resize(motion_.frames * motion_.channelCount);
        for (double& number : motion_.numbers) number = words_.NextNumber("a number of a frame");
        if (!words_.AtEnd()) {
            throw ImportError(words_.Place(), "there is more than the " + std::to_string(motion_.frames) +
                                                  " frames of " + std::to_string(motion_.channelCount) + " channels");
        }
    }

    Words words_;
    BvhMotion motion_;
    int depth_ = 0;
};

}  // namespace

BvhMotion ParseBvh(std::string_view text)
{
    return BvhParser(text).Run();
}

}  // namespace kfshost
