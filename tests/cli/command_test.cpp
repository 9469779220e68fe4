#include "tests/cli/command.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <cstdlib>
#include <sstream>

using nlohmann::json;

namespace {

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

}  // namespace

TEST(Kfs, InfoListsWhatIsAnimated)
{
    Outcome const outcome = RunKfs({"info", Sample});
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ("", outcome.errors);
    EXPECT_EQ(
        "bouncing_ball: 3 streams, 20 keys, 0 s to 2.5 s\n"
        "times in 1/120000 s: every key time of the file is one of these, to 2 units in the last place of its "
        "float\n"
        "all keys are on frames of 24 a second\n"
        "\n"
        "stream                   kind         dimension  components  units  limits   default  separated  keys  "
        "first         last  interpolation\n"
        "bounce/ball/translation  translation          3  x y z       -      -        0 0 0    no            6      "
        "0          2.5  spline\n"
        "bounce/ball/rotation     rotation             4  x y z w     -      -1 to 1  0 0 0 1  -             5      "
        "0          2.5  linear\n"
        "bounce/ball/scale        scale                3  x y z       -      -        1 1 1    -             9      "
        "0  2.333 (7/3)  step\n",
        outcome.output);
}

TEST(Kfs, InfoSaysHowFarKeysAreRounded)
{
    Outcome const outcome = RunKfs({"info", Sample, "--time-scale", "25"});
    EXPECT_EQ(0, outcome.code);
    EXPECT_NE(std::string::npos, outcome.output.find("times in 1/25 s: keys are up to 0.02 s from the file's times\n"))
        << outcome.output;
}

TEST(Kfs, EvalPrintsATableOfFramesAndSeconds)
{
    Outcome const outcome = RunKfs({"eval", Sample, "--stream", "*/scale", "--from", "11f", "--to", "14f"});
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
        RunKfs({"eval", Sample, "--stream", "*/translation", "--to", "1/2", "--fps", "30", "--format", "json"});
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

// Its speed grows by g a second and turns round at the ground; the same along the path; a step has none; a rotation's is at
// right angles to it. The formats agree.
TEST(Kfs, EvalTellsRates)
{
    auto const run = [](std::string const& stream, std::vector<std::string> const& more) {
        std::vector<std::string> arguments{"eval", Sample, "--rate", "--fps", "4", "--to", "3/4", "--stream", stream};
        arguments.insert(arguments.end(), more.begin(), more.end());
        return RunKfs(arguments).output;
    };
    json const fall = json::parse(run("*/translation", {"--format", "json"})).at("streams").at(0);
    EXPECT_EQ(json::array({"x/s", "y/s", "z/s"}), fall.at("components"));
    json const path = json::parse(run("*/translation", {"--format", "json", "--as", "spatial"})).at("streams").at(0);
    EXPECT_FALSE(fall.contains("values"));
    for (json const& rates : {fall.at("rates"), path.at("rates")}) {
        ASSERT_EQ(4U, rates.size());
        EXPECT_NEAR(1.5, rates[2][0].get<double>(), 1e-6);
        EXPECT_NEAR(9.81 * 0.375, rates[2][1].get<double>(), 1e-5) << "up again";
    }
    EXPECT_NEAR(-9.81 / 4, fall.at("rates")[1][1].get<double>(), 1e-5);
    EXPECT_EQ("frame,seconds,bounce/ball/scale.x/s,bounce/ball/scale.y/s,bounce/ball/scale.z/s\n"
              "0,0,0,0,0\n1,0.25,0,0,0\n2,0.5,0,0,0\n3,0.75,0,0,0\n",
              run("*/scale", {"--format", "csv"}));
    EXPECT_EQ(
        0U,
        run("*/scale", {}).find("bounce/ball/scale\nframe  seconds  x/s  y/s  z/s\n    0        0    0    0    0\n"));
    json const turn = json::parse(run("*/rotation", {"--format", "json"})).at("streams").at(0).at("rates");
    json const raw = json::parse(run("*/rotation", {"--format", "json", "--raw"})).at("streams").at(0).at("rates");
    EXPECT_EQ(raw[0], raw[1]) << "straight from key to key";
    EXPECT_LT(std::abs(turn[0][3].get<double>()), 1e-12);
}

// The three formats print the same doubles, to the last bit.
TEST(Kfs, NumbersReadBackAsTheyWere)
{
    std::vector<std::string> const common{"eval", Sample, "--stream", "*/translation", "--fps", "30000/1001"};
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
    Outcome const outcome = RunKfs({"eval", Sample, "--stream", "*/scale", "--from", "-1000000", "--to", "1000000",
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
    Outcome const outcome = RunKfs({"plot", Sample, "-o", drawing});
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ("", outcome.output + outcome.errors);
    std::string const svg = FileContent(drawing);
    for (char const* part :
         {"<svg ", "bounce/ball/translation", "bounce/ball/rotation", "bounce/ball/scale", "seconds", "</svg>"})
        EXPECT_NE(std::string::npos, svg.find(part)) << part;
    EXPECT_EQ(20U, Count(svg, "<polyline"));  // value and speed of 3 + 4 + 3 components
    EXPECT_EQ(std::string::npos, svg.find("nan"));
    EXPECT_EQ(svg, RunKfs({"plot", Sample, "-o", "-"}).output);
    // Quaternions of length 1 are on arcs between the five linear keys.
    std::string const arcs = RunKfs({"plot", Sample, "--stream", "*/rotation", "-o", "-"}).output;
    std::size_t const points = arcs.find("<polyline");
    ASSERT_NE(std::string::npos, points);
    EXPECT_LT(20U, Count(arcs.substr(points, arcs.find("/>", points) - points), ","));
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
}

// A hundred thousand keys that jump up and down: all extremes are there, in a file that can be looked at.
TEST(Kfs, PlotOfManyKeysStaysSmall)
{
    ScratchFolder const folder;
    std::vector<std::string> rows;
    for (int i = 0; i < 100000; ++i) rows.push_back(std::to_string(i * 7919 % 1000) + (i % 2 ? " 1 -3" : " 2 4"));
    std::string const file = folder.Write("a.bvh", Motion(rows, "0.01"));
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

TEST(Kfs, HelpTellsTheCommandsAndTheirOptions)
{
    Outcome const help = RunKfs({"--help"});
    EXPECT_EQ(0, help.code);
    for (char const* word : {"info", "eval", "plot", "Exit codes"})
        EXPECT_NE(std::string::npos, help.output.find(word)) << word;
    Outcome const eval = RunKfs({"eval", "--help"});
    EXPECT_EQ(0, eval.code);
    for (char const* word : {"FILE", "--stream", "--from", "--to", "--fps", "--rate", "--format", "--time-scale"})
        EXPECT_NE(std::string::npos, eval.output.find(word)) << word;
}
