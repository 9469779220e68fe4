#include "host/import.h"
#include "host/import_error.h"
#include "tests/host/hosttest.h"

using kfshost::Rational;

namespace {

constexpr char const* Good = "HIERARCHY\n"
                             "ROOT Hips\n"
                             "{\n"
                             "  OFFSET 0 0 0\n"
                             "  CHANNELS 6 Xposition Yposition Zposition Zrotation Xrotation Yrotation\n"
                             "  JOINT Left Leg\n"
                             "  {\n"
                             "    OFFSET 1.5 -2 +3e-1\n"
                             "    CHANNELS 3 Zrotation Xrotation Yrotation\n"
                             "    End Site\n"
                             "    {\n"
                             "      OFFSET 0 -1 0\n"
                             "    }\n"
                             "  }\n"
                             "}\n"
                             "MOTION\n"
                             "Frames: 3\n"
                             "Frame Time: 0.04\n"
                             "0 1 2 3 4 5 6 7 8\n"
                             "10 11 12 13 14 15 16 17 18\n"
                             "20 21 22 23 24 25 26 27 28\n";

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

TEST_F(BvhInput, BecomesAStreamForPositionsAndOneForAngles)
{
    kfshost::Scene const scene = Import(Good);
    EXPECT_EQ("walk", scene.name);
    EXPECT_EQ(120000U, scene.timeScale);
    ASSERT_EQ(3U, scene.streams.size());
    EXPECT_EQ("motion/Hips/translation", scene.streams[0].path);
    EXPECT_EQ("motion/Hips/angles", scene.streams[1].path);
    EXPECT_EQ("motion/Left Leg/angles", scene.streams[2].path);
    EXPECT_EQ((std::vector<std::string>{"Zrotation", "Xrotation", "Yrotation"}), scene.streams[2].components);
    EXPECT_EQ("joints[1]", scene.streams[2].place);
    EXPECT_EQ(Rational(2, 25), kfshost::KeyTime(*scene.streams[2].stream, 2));
    EXPECT_EQ(7.0, ReadOne(*scene.streams[2].stream, Rational(), 1));
    EXPECT_EQ(12.0, ReadOne(*scene.streams[2].stream, Rational(1, 50), 1));
}

TEST_F(BvhInput, LineEndsAndBlanksDoNotMatter)
{
    std::string text = Good;
    for (std::size_t at = 0; (at = text.find('\n', at)) != std::string::npos; at += 2) text.replace(at, 1, "\r\n");
    kfshost::Scene const scene = Import("\xEF\xBB\xBF\n \t" + text + "\n\n");
    ASSERT_EQ(3U, scene.streams.size());
    EXPECT_EQ("motion/Left Leg/angles", scene.streams[2].path);
    EXPECT_EQ(27.0, ReadOne(*scene.streams[2].stream, Rational(1, 1), 1));
}

TEST_F(BvhInput, NoFramesAreStreamsWithoutKeys)
{
    std::string const text = With("Frames: 3", "Frames: 0");
    kfshost::Scene const scene = Import(text.substr(0, text.find("0 1 2 3")));
    ASSERT_EQ(3U, scene.streams.size());
    EXPECT_EQ(0, kfshost::KeyCount(*scene.streams[0].stream));
}

TEST_F(BvhInput, SaysWhatIsWrongAndOnWhichLine)
{
    struct Row {
        std::string text;
        char const* error;
    };
    Row const rows[] = {
        {"", "line 1: the file ends where HIERARCHY should be"},
        {"gltf", "line 1: \"gltf\" stands where HIERARCHY should be"},
        {With("ROOT Hips", "ROOT"), "line 2: a joint has no name"},
        {With("OFFSET 0 0 0", "OFFSET 0 zero 0"), "line 4: \"zero\" isn't a number of an offset"},
        {With("CHANNELS 6", "CHANNELS 7"), "line 5: a joint has up to six channels, given once"},
        {With("CHANNELS 6", "CHANNELS -1"), "line 5: \"-1\" isn't a count of channels"},
        {With("Xposition", "Xscale"), "line 5: \"Xscale\" isn't a channel, or is given twice"},
        {With("Yposition", "Xposition"), "line 5: \"Xposition\" isn't a channel, or is given twice"},
        {With("JOINT", "BONE"), "line 6: \"BONE\" isn't a member of a joint"},
        {With("End Site", "End"), "line 11: \"{\" stands where Site should be"},
        {std::string(Good).substr(0, 60), "line 5: the file ends where a channel's name should be"},
        {With("Frames: 3", "Frames: three"), "line 17: \"three\" isn't a count of frames"},
        {With("Frames: 3", "Frames: 1000000"), "line 18: the file is too short for 1000000 frames of 9 channels"},
        {With("Frames: 3", "Frames: 18446744073709551615"),
         "line 18: the file is too short for 18446744073709551615 frames of 9 channels"},
        {With("Frames: 3", "Frames: 4"), "line 22: the file ends where a number of a frame should be"},
        {With("Frames: 3", "Frames: 2"), "line 21: there is more than the 2 frames of 9 channels"},
        {With("0.04", "0"), "line 18: \"0\" isn't a frame time in seconds"},
        {With("0.04", "fast"), "line 18: \"fast\" isn't a frame time in seconds"},
        {With("0.04", "2e9"), "Frame Time: the frames don't fit a 32-bit time line of that scale"},
        {With("0.04", "1e-12"), "Frame Time: frames are closer than 1/1073640000 s"},
        {With("10 11", "10 nan"), "line 20: \"nan\" isn't a number of a frame"},
        {With("10 11", "10 1e400"), "line 20: \"1e400\" isn't a number of a frame"},
    };
    for (Row const& row : rows) EXPECT_EQ(row.error, ErrorOf(row.text)) << row.text.substr(0, 40);
}

// Joints inside joints cost no stack.
TEST_F(BvhInput, AnyDepthIsFine)
{
    constexpr int depth = 20000;
    std::string text = "HIERARCHY\nROOT a { OFFSET 0 0 0 CHANNELS 1 Xrotation\n";
    text.replace(text.find(" {"), 2, "\n{");
    for (int i = 0; i < depth; ++i) text += "JOINT b\n{\n";
    for (int i = 0; i <= depth; ++i) text += "}\n";
    EXPECT_EQ(1U, Import(text + "MOTION\nFrames: 1\nFrame Time: 1\n5\n").streams.size());
}
