// Answers held against numbers. What commands print is in the transcripts.
#include "tests/cli/command.h"

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include <algorithm>
#include <cmath>
#include <sstream>

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

std::string Plot(std::vector<std::string> arguments)
{
    arguments.insert(arguments.begin(), "plot");
    arguments.insert(arguments.end(), {"-o", "-"});
    return RunKfs(arguments).output;
}

// The numbers of a text, whatever stands between them.
std::vector<double> NumbersOf(std::string text)
{
    for (char& c : text)
        if (std::string("0123456789.-e").find(c) == std::string::npos) c = ' ';
    std::istringstream stream(text);
    std::vector<double> numbers;
    for (double number = 0.0; stream >> number;) numbers.push_back(number);
    return numbers;
}

// The ball falls under gravity from rest: y = h - g t^2 / 2, and the keys' speeds make the spline say so.
TEST(Kfs, EvalAnswersTheParabolaOfAFall)
{
    json const document = Eval({Sample, "--stream", "*/translation", "--to", "1/2", "--fps", "30"});
    ASSERT_EQ(16U, document.at("times").size());
    for (std::size_t i = 0; i < 16; ++i) {
        double const seconds = document.at("times")[i][0].get<double>() / document.at("times")[i][1].get<double>();
        json const& row = document.at("streams").at(0).at("values")[i];
        EXPECT_NEAR(9.81 / 2 * (0.25 - seconds * seconds), row[1].get<double>(), 1e-6);
        EXPECT_NEAR(1.5 * seconds, row[0].get<double>(), 1e-6);
    }
}

// Its speed grows by g a second and turns round at the ground, also where it is held as a path.
TEST(Kfs, EvalTellsTheSpeedOfAFall)
{
    for (std::string const form : {"plain", "spatial"}) {
        json const fall =
            Eval({Sample, "--rate", "--as", form, "--stream", "*/translation", "--to", "1/2", "--fps", "30"});
        json const& rates = fall.at("streams").at(0).at("rates");
        ASSERT_EQ(16U, rates.size());
        EXPECT_NEAR(1.5, rates[15][0].get<double>(), 1e-6);
        EXPECT_NEAR(9.81 * 0.375, rates[15][1].get<double>(), 1e-5) << "up again";
        for (std::size_t i = 0; i < 15 && form == "plain"; ++i)
            EXPECT_NEAR(-9.81 * static_cast<double>(i) / 30, rates[i][1].get<double>(), 1e-5) << i;
    }
}

// The three formats print the same doubles, to the last bit.
TEST(Kfs, NumbersReadBackAsTheyWere)
{
    std::vector<double> found[3];
    for (auto const& [format, numbers] : {std::pair{"json", &found[0]}, {"csv", &found[1]}, {"table", &found[2]}}) {
        std::string text =
            RunKfs({"eval", Sample, "--stream", "*/translation", "--fps", "30000/1001", "--format", format}).output;
        if (text.front() == '{') text.erase(0, text.find("\"values\""));
        std::ranges::replace(text, '[', '\n');  // a line for each row
        std::istringstream lines(text);
        for (std::string line; std::getline(lines, line);)
            if (std::vector<double> const row = NumbersOf(line); row.size() >= 3)
                numbers->insert(numbers->end(), row.end() - 3, row.end());
    }
    EXPECT_EQ(76U * 3, found[0].size());  // the last key is between two frames, and its pose is in
    EXPECT_EQ(found[0], found[1]);
    EXPECT_EQ(found[0], found[2]);
}

// The keys are where they were; between them the ball is elsewhere on its way, but nothing else changes.
TEST(Kfs, SpatialAgreesWithPlainAtKeysAndInAllThatIsNoPosition)
{
    json const plain = Eval({Sample, "--fps", "12"}), spatial = Eval({Sample, "--fps", "12", "--as", "spatial"});
    json const &streams = plain.at("streams"), &others = spatial.at("streams");
    for (std::size_t frame : {0U, 6U, 15U, 22U, 27U, 30U})
        EXPECT_EQ(streams[0].at("values")[frame], others[0].at("values")[frame]) << frame;
    EXPECT_NE(streams[0].at("values")[3], others[0].at("values")[3]);
    EXPECT_TRUE(streams[1] == others[1] && streams[2] == others[2] && others.size() == 3);
    EXPECT_EQ(plain, Eval({Sample, "--fps", "12", "--as", "plain"}));
}

TEST(Kfs, RovingMakesEqualStepsOfUnequalLegsWithoutADipOfSpeed)
{
    ScratchFolder const folder;
    std::string const file = folder.Write("a.bvh", Motion({"0 0 0", "1 0 0", "1 3 0"}));
    json const values = Eval({file, "--as", "spatial", "--rove", "--fps", "4"}).at("streams")[0].at("values");
    ASSERT_EQ(9U, values.size());
    for (std::size_t i = 0; i + 1 < values.size(); ++i) {
        auto const a = values[i].get<std::vector<double>>(), b = values[i + 1].get<std::vector<double>>();
        EXPECT_NEAR(0.5, std::hypot(b[0] - a[0], b[1] - a[1], b[2] - a[2]), 1e-3) << i;
    }
    // The corners of the route are no dips of the speed, which is one smooth hill.
    std::string const svg = Plot({"--motion", Sample, "--rove"}), line = svg.substr(svg.rfind("points=\"") + 8);
    std::vector<double> const points = NumbersOf(line.substr(0, line.find('"')));
    ASSERT_GT(points.size(), 200U);
    for (std::size_t i = 5; i < points.size(); i += 2)
        EXPECT_LT(std::abs(points[i] - 2 * points[i - 2] + points[i - 4]), 0.5) << i;
}

// A hundred thousand keys that jump up and down: all extremes are there, in a file that can be looked at.
TEST(Kfs, DrawingsOfManyKeysStaySmall)
{
    ScratchFolder const folder;
    std::vector<std::string> rows;
    for (int i = 0; i < 100000; ++i) rows.push_back(std::to_string(i * 7919 % 1000) + (i % 2 ? " 1 -3" : " 2 4"));
    std::string const file = folder.Write("a.bvh", Motion(rows, "0.01"));
    for (char const* kind : {"--frames", "--motion"}) {
        std::size_t const size = Plot({file, kind}).size();
        EXPECT_TRUE(size > 50'000 && size < 2'000'000) << kind << ": " << size;
    }
    // A frame a second for a thousand seconds: dots stand apart, and only the ends of so many keys are marked.
    rows.resize(1000);
    for (std::size_t i = 0; i < rows.size(); ++i) rows[i] = std::to_string(i) + " 0 0";
    std::string const svg = Plot({"--motion", folder.Write("a.bvh", Motion(rows))});
    auto const count = [&](std::string const& part) {
        std::size_t found = 0;
        for (std::size_t at = 0; (at = svg.find(part, at)) != std::string::npos; ++at) ++found;
        return found;
    };
    EXPECT_EQ(4U + 1U, count("Z\" "));
    EXPECT_EQ(1U, count(">first, last key<"));
    EXPECT_TRUE(count("h0") > 50 && count("h0") < 200) << count("h0");
}

TEST(Kfs, HelpTellsTheCommandsAndTheirOptions)
{
    for (auto const& [command, words] :
         {std::pair<char const*, std::vector<char const*>>{"", {"info", "eval", "plot", "Exit codes"}},
          {"eval", {"FILE", "--stream", "--from", "--to", "--fps", "--rate", "--format", "--time-scale"}}}) {
        std::vector<std::string> arguments{command, "--help"};
        if (arguments[0].empty()) arguments.erase(arguments.begin());
        Outcome const help = RunKfs(arguments);
        EXPECT_EQ(0, help.code);
        for (char const* word : words) EXPECT_NE(std::string::npos, help.output.find(word)) << word;
    }
}

}  // namespace
