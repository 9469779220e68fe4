#include "tests/cli/command.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <cmath>
#include <sstream>
#include <string>
#include <vector>

using nlohmann::json;

namespace {

json Eval(std::vector<std::string> arguments)
{
    arguments.insert(arguments.begin(), "eval");
    arguments.insert(arguments.end(), {"--format", "json"});
    Outcome const outcome = RunKfs(arguments);
    EXPECT_EQ("", outcome.errors);
    return json::parse(outcome.output);
}

std::string DrawMotion(std::string const& file, std::vector<std::string> const& more = {})
{
    std::vector<std::string> arguments{"plot", "--motion", file, "-o", "-"};
    arguments.insert(arguments.end(), more.begin(), more.end());
    Outcome const outcome = RunKfs(arguments);
    EXPECT_EQ(0, outcome.code) << outcome.errors;
    EXPECT_EQ(0U, Count(outcome.output, "nan") + Count(outcome.output, "inf"));
    return outcome.output;
}

}  // namespace

// The keys are where they were; between them the ball is elsewhere on its way, but nothing else changes.
TEST(KfsMotion, SpatialAgreesWithPlainAtKeysAndInAllThatIsNoPosition)
{
    json const plain = Eval({Sample, "--fps", "12"});
    json const spatial = Eval({Sample, "--fps", "12", "--as", "spatial"});
    ASSERT_EQ(3U, spatial.at("streams").size());
    json const& places = spatial.at("streams")[0].at("values");
    for (std::size_t frame : {0U, 6U, 15U, 22U, 27U, 30U})
        EXPECT_EQ(plain.at("streams")[0].at("values")[frame], places[frame]) << frame;
    EXPECT_NE(plain.at("streams")[0].at("values")[3], places[3]);
    EXPECT_EQ(plain.at("streams")[1], spatial.at("streams")[1]);
    EXPECT_EQ(plain.at("streams")[2], spatial.at("streams")[2]);
    EXPECT_EQ(plain, Eval({Sample, "--fps", "12", "--as", "plain"}));
}

TEST(KfsMotion, RovingMakesEqualStepsOfUnequalLegs)
{
    ScratchFolder const folder;
    std::string const file = folder.Write("a.bvh", Motion({"0 0 0", "1 0 0", "1 3 0"}));
    json const values = Eval({file, "--as", "spatial", "--rove", "--fps", "4"}).at("streams")[0].at("values");
    ASSERT_EQ(9U, values.size());
    for (std::size_t i = 0; i + 1 < values.size(); ++i) {
        double squares = 0.0;
        for (std::size_t d = 0; d < 3; ++d)
            squares += std::pow(values[i + 1][d].get<double>() - values[i][d].get<double>(), 2);
        EXPECT_NEAR(0.5, std::sqrt(squares), 1e-3) << i;
    }
}

TEST(KfsMotion, InfoSaysWhatIsAPath)
{
    std::string const text = RunKfs({"info", Sample, "--as", "spatial", "--rove", "--stream", "*l/t*"}).output;
    EXPECT_NE(std::string::npos, text.find("spline path, 4 float keys\n")) << text;
    EXPECT_EQ(std::string::npos, RunKfs({"info", Sample}).output.find("path"));
}

// 6 keys in space and 6 below the speed, and one more of each kind in the legend; 10 tangents, 61 frames.
TEST(KfsMotion, TheDrawingHasItsMarks)
{
    std::string const svg = DrawMotion(Sample);
    EXPECT_EQ(1U + 1U, Count(svg, "<polyline"));  // five arcs in one, and the speed
    EXPECT_EQ(12U + 1U, Count(svg, "Z\" "));
    EXPECT_EQ(61U + 1U, Count(svg, "h0"));
    EXPECT_EQ(10U + 1U, Count(svg, "r=\"3.5\""));
    EXPECT_EQ(0U, Count(svg, "float key"));
    for (char const* text : {"from the front", ">route<", ">each frame, 1/24 s<", ">tangent<", ">1.25 s<", ">seconds<"})
        EXPECT_EQ(1U, Count(svg, text)) << text;
    std::string const roving = DrawMotion(Sample, {"--rove"});  // whose float keys have a mark of their own
    EXPECT_EQ(4U + 1U, Count(roving, "Z\" "));
    EXPECT_EQ(8U + 1U, Count(roving, "r=\"5\""));
    EXPECT_EQ(1U, Count(roving, ">float key<"));
}

TEST(KfsMotion, ItIsSeenFromTheSideThatShowsMost)
{
    ScratchFolder const folder;
    struct Row {
        std::vector<std::string> places;
        std::vector<std::string> captions;
    };
    std::string const front = "from the front";
    std::string const side = "from the side";
    std::string const above = "from above";
    for (Row const& row :
         {Row{{"0 0 0", "9 5 1"}, {front}}, Row{{"0 0 0", "1 5 9"}, {side}}, Row{{"0 0 0", "9 1 5"}, {above}},
          Row{{"0 0 0", "9 5 4"}, {front, side, above}}, Row{{"7 0 0", "7 0 0"}, {front}}, Row{{"1 2 3"}, {front}}}) {
        std::string const svg = DrawMotion(folder.Write("a.bvh", Motion(row.places)));
        EXPECT_EQ(row.captions.size(), Count(svg, ">from ")) << row.places.back();
        for (std::string const& caption : row.captions) EXPECT_EQ(1U, Count(svg, caption)) << row.places.back();
    }
}

// The corners of the route are no dips of the speed, which is one smooth hill.
TEST(KfsMotion, TheSpeedOfRovingKeysIsSmooth)
{
    std::string const svg = DrawMotion(Sample, {"--rove"});
    std::istringstream points(svg.substr(svg.rfind("points=\"") + 8));
    std::vector<double> heights;
    for (double x = 0.0, y = 0.0; points >> x && points.ignore(1, ',') && points >> y;) heights.push_back(y);
    ASSERT_GT(heights.size(), 100U);
    for (std::size_t i = 2; i < heights.size(); ++i)
        EXPECT_LT(std::abs(heights[i] - 2 * heights[i - 1] + heights[i - 2]), 0.5) << i;
}

// A frame a second for a thousand seconds: dots stand apart, and only the ends of so many keys are marked.
TEST(KfsMotion, ManyKeysDontHideTheRoute)
{
    ScratchFolder const folder;
    std::vector<std::string> rows;
    for (int i = 0; i < 1000; ++i) rows.push_back(std::to_string(i) + " 0 0");
    std::string const svg = DrawMotion(folder.Write("a.bvh", Motion(rows)));
    EXPECT_EQ(4U + 1U, Count(svg, "Z\" "));
    EXPECT_EQ(1U, Count(svg, ">first, last key<"));
    EXPECT_GT(Count(svg, "h0"), 50U);
    EXPECT_LT(Count(svg, "h0"), 200U);
}
