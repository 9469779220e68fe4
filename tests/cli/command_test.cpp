#include "tests/cli/command.h"
#include "tests/support/places.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <sstream>

using nlohmann::json;

namespace {

std::string Sample()
{
    return kfstest::SamplesFolder() / "bouncing_ball.gltf";
}

std::vector<std::string> Lines(std::string const& text)
{
    std::vector<std::string> lines;
    std::istringstream stream(text);
    for (std::string line; std::getline(stream, line);) lines.push_back(line);
    return lines;
}

std::vector<std::string> Cells(std::string const& line, char separator)
{
    std::vector<std::string> cells;
    std::istringstream stream(line);
    for (std::string cell; std::getline(stream, cell, separator);) cells.push_back(cell);
    return cells;
}

void ExpectFailure(Outcome const& outcome, std::string const& error)
{
    EXPECT_EQ(2, outcome.code);
    EXPECT_EQ("", outcome.output);
    EXPECT_EQ("kfs: " + error + '\n', outcome.errors);
}

}  // namespace

TEST(Kfs, InfoListsWhatIsAnimated)
{
    Outcome const outcome = RunKfs({"info", Sample()});
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ("", outcome.errors);
    EXPECT_EQ("bouncing_ball: 3 streams, 20 keys, 0 s to 2.5 s\n"
              "times in 1/120000 s: every key time of the file is one of these, to 2 units in the last place of its "
              "float\n"
              "all keys are on frames of 24 a second\n"
              "\n"
              "stream                   kind         dimension  components  keys  first         last  interpolation\n"
              "bounce/ball/translation  translation          3  x y z          6      0          2.5  spline\n"
              "bounce/ball/rotation     rotation             4  x y z w        5      0          2.5  linear\n"
              "bounce/ball/scale        scale                3  x y z          9      0  2.333 (7/3)  step\n",
              outcome.output);
}

TEST(Kfs, InfoSaysHowFarKeysAreRounded)
{
    Outcome const outcome = RunKfs({"info", Sample(), "--time-scale", "25"});
    EXPECT_EQ(0, outcome.code);
    EXPECT_NE(std::string::npos, outcome.output.find("times in 1/25 s: keys are up to 0.02 s from the file's times\n"))
        << outcome.output;
}

TEST(Kfs, EvalPrintsATableOfFramesAndSeconds)
{
    Outcome const outcome = RunKfs({"eval", Sample(), "--stream", "*/scale", "--from", "11f", "--to", "14f"});
    EXPECT_EQ("", outcome.errors);
    EXPECT_EQ("bounce/ball/scale\n"
              "frame  seconds                   x                  y                   z\n"
              "   11    11/24                   1                  1                   1\n"
              "   12      1/2  1.2000000476837158  0.699999988079071  1.2000000476837158\n"
              "   13    13/24  1.2000000476837158  0.699999988079071  1.2000000476837158\n"
              "   14     7/12                   1                  1                   1\n",
              outcome.output);
}

// The ball falls under gravity from rest: y = h - g t^2 / 2, and the keys' speeds make the spline say so.
TEST(Kfs, EvalAnswersTheParabolaOfAFall)
{
    Outcome const outcome =
        RunKfs({"eval", Sample(), "--stream", "*/translation", "--to", "1/2", "--fps", "30", "--format", "json"});
    ASSERT_EQ(0, outcome.code);
    json const document = json::parse(outcome.output);
    EXPECT_EQ(json::array({30, 1}), document.at("fps"));
    ASSERT_EQ(16U, document.at("times").size());
    json const& stream = document.at("streams").at(0);
    EXPECT_EQ("bounce/ball/translation", stream.at("path"));
    EXPECT_EQ("spline", stream.at("interpolation"));
    EXPECT_EQ(json::array({"x", "y", "z"}), stream.at("components"));
    for (std::size_t i = 0; i < 16; ++i) {
        double const seconds = document.at("times")[i][0].get<double>() / document.at("times")[i][1].get<double>();
        EXPECT_NEAR(9.81 / 2 * (0.25 - seconds * seconds), stream.at("values")[i][1].get<double>(), 1e-6);
        EXPECT_NEAR(1.5 * seconds, stream.at("values")[i][0].get<double>(), 1e-6);
    }
}

// The three formats print the same doubles, to the last bit.
TEST(Kfs, NumbersReadBackAsTheyWere)
{
    std::vector<std::string> const common{"eval", Sample(), "--stream", "*/translation", "--fps", "30000/1001"};
    auto const with = [&](char const* format) {
        std::vector<std::string> arguments = common;
        arguments.insert(arguments.end(), {"--format", format});
        return RunKfs(arguments).output;
    };
    json const document = json::parse(with("json"));
    std::vector<std::string> const csv = Lines(with("csv"));
    std::vector<std::string> const table = Lines(with("table"));
    json const& values = document.at("streams").at(0).at("values");
    ASSERT_EQ(76U, values.size());  // the last key is between two frames, and its pose is in
    ASSERT_EQ(values.size() + 1, csv.size());
    ASSERT_EQ(values.size() + 2, table.size());
    EXPECT_EQ("frame,seconds,bounce/ball/translation.x,bounce/ball/translation.y,bounce/ball/translation.z", csv[0]);
    for (std::size_t i = 0; i < values.size(); ++i) {
        std::vector<std::string> const cells = Cells(csv[i + 1], ',');
        ASSERT_EQ(5U, cells.size());
        EXPECT_EQ(std::to_string(i), cells[0]);
        std::istringstream row(table[i + 2]);
        std::string cell;
        row >> cell >> cell;
        for (std::size_t d = 0; d < 3; ++d) {
            row >> cell;
            EXPECT_EQ(values[i][d].get<double>(), std::strtod(cells[d + 2].c_str(), nullptr));
            EXPECT_EQ(values[i][d].get<double>(), std::strtod(cell.c_str(), nullptr));
        }
    }
}

// Long before and after the keys, past what 32 bits of the file's scale hold.
TEST(Kfs, EvalHoldsTheEndsForever)
{
    Outcome const outcome = RunKfs({"eval", Sample(), "--stream", "*/scale", "--from", "-1000000", "--to", "1000000",
                                    "--fps", "1/2000000", "--format", "csv"});
    EXPECT_EQ("frame,seconds,bounce/ball/scale.x,bounce/ball/scale.y,bounce/ball/scale.z\n"
              "-1/2,-1000000,1,1,1\n"
              "1/2,1000000,1,1,1\n",
              outcome.output);
}

TEST(Kfs, PlotDrawsEveryCurveWithItsLegend)
{
    ScratchFolder const folder;
    std::string const drawing = folder.Path("ball.svg");
    Outcome const outcome = RunKfs({"plot", Sample(), "-o", drawing});
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ("", outcome.output + outcome.errors);
    std::string const svg = FileContent(drawing);
    for (char const* part :
         {"<svg ", "bounce/ball/translation", "bounce/ball/rotation", "bounce/ball/scale", "seconds", "</svg>"})
        EXPECT_NE(std::string::npos, svg.find(part)) << part;
    std::size_t curves = 0;
    for (std::size_t at = 0; (at = svg.find("<polyline", at)) != std::string::npos; ++at) ++curves;
    EXPECT_EQ(20U, curves);  // value and speed of 3 + 4 + 3 components
    EXPECT_EQ(std::string::npos, svg.find("nan"));
    EXPECT_EQ(svg, RunKfs({"plot", Sample(), "-o", "-"}).output);
}

// One key, keys that are all alike, and numbers at the end of what doubles hold.
TEST(Kfs, PlotCopesWithWhatHasNoExtentAndWithTooMuchOfIt)
{
    ScratchFolder const folder;
    std::string const head = "HIERARCHY\nROOT a\n{\nCHANNELS 2 Xrotation Yrotation\n}\nMOTION\n";
    std::string const drawing = folder.Path("x.svg");
    for (char const* motion :
         {"Frames: 1\nFrame Time: 1\n5 5", "Frames: 2\nFrame Time: 1\n0 0\n0 0",
          "Frames: 2\nFrame Time: 0.001\n1e12 1\n-1e12 1", "Frames: 2\nFrame Time: 1000\n1e-9 0 0 1e-9"}) {
        Outcome const outcome = RunKfs({"plot", folder.Write("a.bvh", head + motion), "-o", drawing});
        EXPECT_EQ(0, outcome.code) << outcome.errors;
        std::string const svg = FileContent(drawing);
        EXPECT_EQ(std::string::npos, svg.find("nan")) << motion;
        EXPECT_EQ(std::string::npos, svg.find("inf")) << motion;
    }
    ExpectFailure(
        RunKfs({"plot", folder.Write("a.bvh", head + "Frames: 2\nFrame Time: 1\n1e308 1\n-1e308 1"), "-o", drawing}),
        folder.Path("a.bvh") + ": motion/a/angles: the numbers are too large to draw");
    ExpectFailure(RunKfs({"plot", folder.Write("a.bvh", head + "Frames: 0\nFrame Time: 1"), "-o", drawing}),
                  folder.Path("a.bvh") + ": the chosen streams have no keys to draw");
}

// A hundred thousand keys that jump up and down: all extremes are there, in a file that can be looked at.
TEST(Kfs, PlotOfManyKeysStaysSmall)
{
    ScratchFolder const folder;
    std::string text = "HIERARCHY\nROOT a\n{\nCHANNELS 3 Xposition Yposition Zposition\n}\nMOTION\n"
                       "Frames: 100000\nFrame Time: 0.01\n";
    for (int i = 0; i < 100000; ++i) text += std::to_string(i * 7919 % 1000) + (i % 2 ? " 1 -3\n" : " 2 4\n");
    std::string const file = folder.Write("a.bvh", text);
    for (char const* kind : {"--frames", "--motion"}) {
        std::string const svg = RunKfs({"plot", file, kind, "-o", "-"}).output;
        EXPECT_GT(svg.size(), 50'000U) << kind;
        EXPECT_LT(svg.size(), 2'000'000U) << kind;
    }
    std::string const part =
        RunKfs({"plot", file, "--from", "1", "--to", "1.05", "--components", "Yposition", "-o", "-"}).output;
    EXPECT_EQ(std::string::npos, part.find(">Xposition<"));
    EXPECT_NE(std::string::npos, part.find(">Yposition<"));
    EXPECT_NE(std::string::npos, part.find(">key<"));
}

TEST(Kfs, PlotWritesNothingWhenItFails)
{
    ScratchFolder const folder;
    ExpectFailure(RunKfs({"plot", Sample(), "-o", folder.Path("x.png")}),
                  "-o: \"" + folder.Path("x.png") +
                      "\" is no name for an SVG file, and no other kind is written; rsvg-convert makes others of one");
    ExpectFailure(RunKfs({"plot", Sample(), "--fps", "nope", "-o", folder.Path("x.svg")}),
                  "--fps: \"nope\" isn't a number of frames a second like 24 or 30000/1001");
    ExpectFailure(RunKfs({"info", folder.Path("a\nb.gltf")}),
                  folder.Path("a\\nb.gltf") + ": can't be opened: No such file or directory");
    std::string const drawing = folder.Write("old.svg", "an earlier drawing");
    ExpectFailure(RunKfs({"plot", Sample(), "--stream", "nothing", "-o", drawing}),
                  Sample() + ": --stream nothing: none of the 3 streams has such a path (kfs info lists them)");
    EXPECT_EQ("an earlier drawing", FileContent(drawing));
    std::string const nowhere = folder.Path("none/x.svg");
    ExpectFailure(RunKfs({"plot", Sample(), "-o", nowhere}), nowhere + ": can't be written: No such file or directory");
    EXPECT_EQ(
        1, std::distance(std::filesystem::directory_iterator(folder.Path("")), std::filesystem::directory_iterator()));
}

TEST(Kfs, BadFilesAreOneLineAndCodeTwo)
{
    ScratchFolder const folder;
    std::string const text = FileContent(Sample());
    struct Row {
        char const* name;
        std::string bytes;
        char const* error;
    };
    Row const rows[] = {
        {"empty.gltf", "", "line 1, column 1: the JSON text ends too early"},
        {"short.gltf", "{\"asset\": {", "line 1, column 12: the JSON text ends too early"},
        {"magic.glb", "GLTF and more bytes", "header: this isn't a binary glTF file"},
        {"nothing.gltf", R"({"asset": {"version": "2.0"}})", "nothing is animated"},
        {"old.gltf", R"({"asset": {"version": "1.0"}})", "asset.version: is \"1.0\"; versions 2.x are supported"},
        {"walk.bvh", "HIERARCHY\nROOT a\n{\n}\nMOTION\nFrames: x", "line 6: \"x\" isn't a count of frames"},
        {"walk.txt", "ROOT",
         "begins neither as a project nor as glTF or BVH, and its name doesn't end in .gltf, .glb or .bvh"},
        {"walk", "HIERARCHY", "line 1: the file ends where ROOT should be"},
    };
    for (Row const& row : rows) {
        std::string const file = folder.Write(row.name, row.bytes);
        for (std::vector<std::string> const& command :
             {std::vector<std::string>{"info", file}, {"eval", file}, {"plot", file, "-o", folder.Path("x.svg")}})
            ExpectFailure(RunKfs(command), file + ": " + row.error);
    }
    EXPECT_FALSE(std::filesystem::exists(folder.Path("x.svg")));
    ExpectFailure(RunKfs({"info", folder.Path("gone.glb")}),
                  folder.Path("gone.glb") + ": can't be opened: No such file or directory");
}

TEST(Kfs, BadTimesAreOneLineAndCodeTwo)
{
    ExpectFailure(RunKfs({"eval", Sample(), "--from", "soon"}),
                  "--from: \"soon\" isn't a time: seconds like 0.5 or 1/24, or frames like 12f");
    ExpectFailure(RunKfs({"eval", Sample(), "--from", "2", "--to", "1"}), "--to: 1 s is before --from, 2 s");
    ExpectFailure(RunKfs({"eval", Sample(), "--fps", "0"}),
                  "--fps: \"0\" isn't a number of frames a second like 24 or 30000/1001");
    ExpectFailure(RunKfs({"eval", Sample(), "--fps", "9223372036854775807"}),
                  "a rational number that doesn't fit 64 bits");
    ExpectFailure(RunKfs({"eval", Sample(), "--fps", "1000000"}),
                  "--fps: asks for more than 1000000 times from 0 s to 5/2 s");
}

TEST(Kfs, AnUnknownFormatIsAnsweredWithThoseThatExist)
{
    EXPECT_EQ("kfs: --format: xml not in {table,csv,json} (kfs --help tells what there is)\n",
              RunKfs({"eval", Sample(), "--format", "xml"}).errors);
}

// Mistakes on the command line itself.
TEST(Kfs, UsageErrorsPointToTheHelp)
{
    for (std::vector<std::string> const& command : {std::vector<std::string>{},
                                                    {"draw"},
                                                    {"info"},
                                                    {"info", Sample(), "--nothing"},
                                                    {"plot", Sample()},
                                                    {"eval", Sample(), "--format", "xml"},
                                                    {"info", Sample(), "--time-scale", "-5"}}) {
        Outcome const outcome = RunKfs(command);
        EXPECT_EQ(2, outcome.code);
        EXPECT_EQ("", outcome.output);
        EXPECT_TRUE(outcome.errors.starts_with("kfs: ")) << outcome.errors;
        EXPECT_EQ(outcome.errors.size() - 1, outcome.errors.find('\n')) << outcome.errors;
        EXPECT_NE(std::string::npos, outcome.errors.find("--help")) << outcome.errors;
    }
    EXPECT_EQ("kfs: there is no command \"draw\" (kfs --help tells what there is)\n", RunKfs({"draw"}).errors);
}

TEST(Kfs, HelpTellsTheCommandsAndTheirOptions)
{
    Outcome const help = RunKfs({"--help"});
    EXPECT_EQ(0, help.code);
    for (char const* word : {"info", "eval", "plot", "Exit codes"})
        EXPECT_NE(std::string::npos, help.output.find(word)) << word;
    Outcome const eval = RunKfs({"eval", "--help"});
    EXPECT_EQ(0, eval.code);
    for (char const* word : {"FILE", "--stream", "--from", "--to", "--fps", "--format", "--time-scale"})
        EXPECT_NE(std::string::npos, eval.output.find(word)) << word;
}

TEST(Kfs, AFullDiskIsAFailure)
{
    if (!std::filesystem::exists("/dev/full")) GTEST_SKIP() << "there is no /dev/full here";
    ExpectFailure(RunKfs({"plot", Sample(), "-o", "/dev/full"}),
                  "/dev/full: can't be written: No space left on device");
    ExpectFailure(RunKfs({"eval", Sample()}, "/dev/full"),
                  "standard output: can't be written: No space left on device");
}
