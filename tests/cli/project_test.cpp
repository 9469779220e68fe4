#include "tests/cli/command.h"

#include <gtest/gtest.h>

#include <csignal>

#include <sys/resource.h>

namespace {

// The format, byte for byte: a change of it is a decision. What is saved again is the same.
TEST(KfsProject, TheSamplesBytesAreTheGoldenOnesAndAnswerLikeTheFile)
{
    ScratchFolder const folder;
    std::string const project = folder.Path("ball.of-any-name"), again = folder.Path("again");
    EXPECT_EQ(0, RunKfs({"import", Sample, "-o", project}).code);
    std::string const bytes = FileContent(project);
    ExpectGolden("bouncing_ball.project", bytes);
    for (std::string const& target : {again, project}) {
        EXPECT_EQ(0, RunKfs({"save-as", project, "-o", target}).code);
        EXPECT_TRUE(bytes == FileContent(target));
    }
    std::vector<std::vector<std::string>> const commands{{"info"},
                                                         {"eval", "--format", "json", "--fps", "30"},
                                                         {"eval", "--as", "spatial", "--stream", "*translation"},
                                                         {"plot", "-o", "-"}};
    for (std::vector<std::string> command : commands) {
        SCOPED_TRACE(command.front());
        command.push_back(Sample);
        Outcome const expected = RunKfs(command);
        EXPECT_EQ(0, expected.code) << expected.errors;
        command.back() = project;
        Outcome found = RunKfs(command);
        EXPECT_EQ("", found.errors);
        // The file's name stands in what a JSON answer says of itself.
        if (std::size_t const at = found.output.find(project); at != std::string::npos)
            found.output.replace(at, project.size(), Sample);
        EXPECT_TRUE(expected.output == found.output) << found.output;
    }
}

// Projects from before the leaves of scenes had classes and records of their own.
TEST(KfsProject, AnEarlierProjectAnswersAsEverAndIsSavedAsOneOfToday)
{
    std::string const earlier = kfstest::SourceFolder() / "tests/cli/golden/bouncing_ball_without_records.project";
    Outcome const same = RunKfs({"diff", earlier, Sample});
    EXPECT_EQ(0, same.code) << same.output << same.errors;
    for (std::string const format : {"csv", "table"}) {
        std::vector<std::string> command{"eval", "--raw", "--fps", "30", "--format", format, Sample};
        Outcome const expected = RunKfs(command);
        command.back() = earlier;
        Outcome const found = RunKfs(command);
        EXPECT_EQ(expected.output, found.output);
        EXPECT_EQ("", found.errors);
    }
    EXPECT_TRUE(RunKfs({"import", Sample, "-o", "-"}).output == RunKfs({"save-as", earlier, "-o", "-"}).output);
}

// There and back: the keys are those that were, and in between all commands see the same motion.
TEST(KfsProject, SeparatesAndJoins)
{
    ScratchFolder const folder;
    std::string const apart = folder.Path("apart"), together = folder.Path("together");
    EXPECT_EQ(0, RunKfs({"separate", Sample, "--stream", "*/translation", "-o", apart, "--tolerance", "0"}).code);
    ExpectGolden("bouncing_ball_separated.project", FileContent(apart));
    EXPECT_TRUE(FileContent(apart) == RunKfs({"save-as", apart, "-o", "-"}).output);
    for (std::vector<std::string> command : {std::vector<std::string>{"eval", "--fps", "30"},
                                             {"eval", "--rate", "--format", "csv"},
                                             {"eval", "--as", "spatial"},
                                             {"eval", "--as", "spatial", "--rove"}}) {
        command.insert(command.end(), {"--stream", "*/translation", Sample});
        Outcome const whole = RunKfs(command);
        EXPECT_EQ(0, whole.code) << whole.errors;
        command.back() = apart;
        EXPECT_EQ(whole.output, RunKfs(command).output);
    }
    EXPECT_EQ(0, RunKfs({"join", apart, "--stream", "*/translation*", "-o", together}).code);
    Outcome const same = RunKfs({"diff", Sample, together});
    EXPECT_EQ(0, same.code) << same.output << same.errors;
}

// As on a full disk: the process may not write files of more than so many bytes.
TEST(KfsProject, WhatHasNoRoomLeavesTheOldFile)
{
    ScratchFolder const folder, place;
    std::string const older = folder.Path("old"), newer = folder.Path("new");
    for (auto const& [frames, project] : {std::pair{2U, older}, std::pair{4000U, newer}}) {
        std::vector<std::string> const rows(frames, "1 0 1");
        ASSERT_EQ(0, RunKfs({"import", folder.Write("a.bvh", Motion(rows, "0.04")), "-o", project}).code);
    }
    std::size_t const size = FileContent(newer).size();
    ASSERT_GT(size, 4u * 65536);
    std::string const target = std::filesystem::canonical(place.Write("project", FileContent(older)));
    std::string const refusal = "kfs: " + target + ": can't be saved: can't write \"" + target + "\": File too large\n";
    std::signal(SIGXFSZ, SIG_IGN);  // so that the write fails instead
    rlimit usual;
    ASSERT_EQ(0, getrlimit(RLIMIT_FSIZE, &usual));
    for (std::size_t const limit : {std::size_t{4096}, std::size_t{65536}, std::size_t{100000}, size - 1, size}) {
        SCOPED_TRACE(limit);
        rlimit const most{limit, usual.rlim_max};
        ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &most));
        Outcome const outcome = RunKfs({"save-as", newer, "-o", target});
        ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &usual));
        bool const fits = limit == size;
        EXPECT_EQ(fits ? 0 : 2, outcome.code);
        EXPECT_EQ(fits ? "" : refusal, outcome.errors);
        EXPECT_TRUE(FileContent(fits ? newer : older) == FileContent(target));
        EXPECT_EQ(std::set<std::string>{"project"}, place.Names());
    }
    std::signal(SIGXFSZ, SIG_DFL);
}

}  // namespace
