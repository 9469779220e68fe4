#include "host/import.h"
#include "host/import_error.h"
#include "tests/host/hosttest.h"

#include <sstream>

using kfshost::Rational;

namespace {

constexpr char const* Good = R"(HIERARCHY
ROOT Hips
{
  OFFSET 0 0 0
  CHANNELS 6 Xposition Yposition Zposition Zrotation Xrotation Yrotation
  JOINT Left Leg
  {
    OFFSET 1.5 -2 +3e-1
    CHANNELS 3 Zrotation Xrotation Yrotation
    End Site
    {
      OFFSET 0 -1 0
    }
  }
}
MOTION
Frames: 3
Frame Time: 0.04
0 1 2 3 4 5 6 7 8
10 11 12 13 14 15 16 17 18
20 21 22 23 24 25 26 27 28
)";

class BvhInput : public HostTest {
protected:
    kfshost::Scene Import(std::string const& text) { return kfshost::ImportFile(folder_.Write("walk.bvh", text)); }

    std::string ErrorOf(std::string const& text)
    {
        try {
            Import(text);
        } catch (kfshost::ImportError const& error) {
            return error.what();
        }
        return "";
    }

    // The good text with the first `what` replaced.
    static std::string With(std::string const& what, std::string const& by)
    {
        std::string text = Good;
        return text.replace(text.find(what), what.size(), by);
    }

    ScratchFolder folder_;
};

}  // namespace

// Line ends and blanks don't matter.
TEST_F(BvhInput, BecomesAStreamForPositionsAndOneForAngles)
{
    std::string odd = Good;
    for (std::size_t at = 0; (at = odd.find('\n', at)) != std::string::npos; at += 2) odd.replace(at, 1, "\r\n");
    std::string const empty = With("Frames: 3", "Frames: 0");
    for (std::string const& text :
         {std::string(Good), "\xEF\xBB\xBF\n \t" + odd + "\n\n", empty.substr(0, empty.find("0 1 2 3"))}) {
        kfshost::Scene const scene = Import(text);
        EXPECT_EQ("walk", scene.name);
        EXPECT_EQ(120000U, scene.timeScale);
        ASSERT_EQ(3U, scene.streams.size());
        for (std::size_t i = 0; char const* path : {"Hips/translation", "Hips/angles", "Left Leg/angles"})
            EXPECT_EQ(std::string("motion/") + path, scene.streams[i++].path);
        EXPECT_EQ((std::vector<std::string>{"Zrotation", "Xrotation", "Yrotation"}), scene.streams[2].components);
        EXPECT_EQ("joints[1]", scene.streams[2].place);
        ASSERT_EQ(text.find("Frames: 0") == std::string::npos ? 3 : 0, kfshost::KeyCount(*scene.streams[2].stream));
        if (kfshost::KeyCount(*scene.streams[0].stream) == 0) continue;
        EXPECT_EQ(Rational(2, 25), kfshost::KeyTime(*scene.streams[2].stream, 2));
        EXPECT_EQ(7.0, ReadOne(*scene.streams[2].stream, Rational(), 1));
        EXPECT_EQ(12.0, ReadOne(*scene.streams[2].stream, Rational(1, 50), 1));
    }
}

// What of the good text is replaced by what, and the line that says what is wrong with it.
constexpr char const* Replaced = R"(
HIERARCHY | gltf | line 1: "gltf" stands where HIERARCHY should be
ROOT Hips | ROOT | line 2: a joint has no name
OFFSET 0 0 0 | OFFSET 0 zero 0 | line 4: "zero" isn't a number of an offset
CHANNELS 6 | CHANNELS 7 | line 5: a joint has up to six channels, given once
CHANNELS 6 | CHANNELS -1 | line 5: "-1" isn't a count of channels
Xposition | Xscale | line 5: "Xscale" isn't a channel, or is given twice
Yposition | Xposition | line 5: "Xposition" isn't a channel, or is given twice
JOINT | BONE | line 6: "BONE" isn't a member of a joint
End Site | End | line 11: "{" stands where Site should be
Frames: 3 | Frames: 1000000 | line 18: the file is too short for 1000000 frames of 9 channels
Frames: 3 | Frames: 18446744073709551615 | line 18: the file is too short for 18446744073709551615 frames of 9 channels
Frames: 3 | Frames: 4 | line 22: the file ends where a number of a frame should be
Frames: 3 | Frames: 2 | line 21: there is more than the 2 frames of 9 channels
0.04 | 0 | line 18: "0" isn't a frame time in seconds
0.04 | fast | line 18: "fast" isn't a frame time in seconds
0.04 | 2e9 | Frame Time: the frames don't fit a 32-bit time line of that scale
0.04 | 1e-12 | Frame Time: frames are closer than 1/1073640000 s
10 11 | 10 nan | line 20: "nan" isn't a number of a frame
10 11 | 10 1e400 | line 20: "1e400" isn't a number of a frame
)";

TEST_F(BvhInput, SaysWhatIsWrongAndOnWhichLine)
{
    std::istringstream rows(Replaced);
    for (std::string row; std::getline(rows, row);) {
        std::size_t const first = row.find(" | "), second = row.find(" | ", first + 1);
        if (row.empty()) continue;
        EXPECT_EQ(row.substr(second + 3),
                  ErrorOf(With(row.substr(0, first), row.substr(first + 3, second - first - 3))));
    }
    EXPECT_EQ("line 1: the file ends where HIERARCHY should be", ErrorOf(""));
    EXPECT_EQ("line 5: the file ends where a channel's name should be", ErrorOf(std::string(Good).substr(0, 60)));
}

// Joints inside joints cost no stack.
TEST_F(BvhInput, AnyDepthIsFine)
{
    constexpr int depth = 20000;
    std::string text = "HIERARCHY\nROOT a\n{ OFFSET 0 0 0 CHANNELS 1 Xrotation\n";
    for (int i = 0; i < depth; ++i) text += "JOINT b\n{\n";
    for (int i = 0; i <= depth; ++i) text += "}\n";
    EXPECT_EQ(1U, Import(text + "MOTION\nFrames: 1\nFrame Time: 1\n5\n").streams.size());
}
