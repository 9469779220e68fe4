#include "tests/cli/command.h"
#include "tests/support/places.h"

#include <gtest/gtest.h>

#include <chrono>
#include <csignal>
#include <random>
#include <sstream>
#include <thread>

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

// A folder with the sample as a project.
class KfsProject : public testing::Test {
protected:
    void SetUp() override
    {
        Outcome const outcome = RunKfs({"import", Sample, "-o", project_});
        ASSERT_EQ(0, outcome.code) << outcome.errors;
        EXPECT_EQ(project_ + ": 3 streams, 20 keys\n", outcome.output);
    }

    ScratchFolder folder_;
    std::string const project_ = folder_.Path("ball.of-any-name");
};

TEST_F(KfsProject, SavedAgainItIsTheSameBytesAndTheOldFileStaysWhole)
{
    std::string const bytes = FileContent(project_);
    std::string const copy = folder_.Path("again");
    Outcome const saved = RunKfs({"save-as", project_, "-o", copy});
    EXPECT_EQ(0, saved.code) << saved.errors;
    EXPECT_TRUE(bytes == FileContent(copy));
    EXPECT_EQ(0, RunKfs({"save-as", project_, "-o", project_}).code) << "onto itself";
    EXPECT_TRUE(bytes == FileContent(project_));
    EXPECT_EQ(2, RunKfs({"save-as", Sample, "-o", copy}).code) << "not a project";
    EXPECT_TRUE(bytes == FileContent(copy));
}

// The values of the sample's position at 1.1 s.
std::vector<double> PositionsIn(std::string const& file)
{
    std::string const text =
        RunKfs({"eval", file, "--stream", "*/translation", "--from", "1.1", "--to", "1.1", "--format", "csv"}).output;
    std::istringstream line(text.substr(text.find('\n') + 1));
    std::vector<double> values;
    for (std::string cell; std::getline(line, cell, ',');) values.push_back(std::atof(cell.c_str()));
    return values;
}

TEST_F(KfsProject, ADraggedComponentHasItsValueAndTheOthersStay)
{
    std::string const dragged = folder_.Path("dragged");
    std::string const picture = folder_.Path("drag.svg");
    std::vector<double> expected = PositionsIn(project_);
    ASSERT_EQ(5U, expected.size());
    Outcome const outcome = RunKfs({"drag", project_, "--stream", "*/translation", "--component", "y", "--at", "1.1",
                                    "--to", "-2.5", "--plot", picture, "-o", dragged});
    EXPECT_EQ(0, outcome.code) << outcome.errors;
    EXPECT_EQ(dragged + ": bounce/ball/translation dragged to -2.5 at 11/10 s\n", outcome.output);
    expected[3] = -2.5;
    std::vector<double> const found = PositionsIn(dragged);
    ASSERT_EQ(5U, found.size());
    for (std::size_t i = 0; i < 5; ++i) EXPECT_NEAR(expected[i], found[i], 1e-12) << i;
    EXPECT_EQ(1U, Count(FileContent(picture), ">y after<"));
}

// Starts `kfs save-as from -o to` and kills it after a while, unless it is done by then.
void KillWhileSaving(std::string const& from, std::string const& to, std::chrono::microseconds after)
{
    pid_t const child = fork();
    ASSERT_NE(-1, child);
    if (child == 0) {
        int const nowhere = open("/dev/null", O_WRONLY);
        dup2(nowhere, STDOUT_FILENO);
        execl(kfstest::Command(), kfstest::Command(), "save-as", from.c_str(), "-o", to.c_str(), nullptr);
        _exit(127);
    }
    std::this_thread::sleep_for(after);
    kill(child, SIGKILL);
    int status = 0;
    ASSERT_EQ(child, waitpid(child, &status, 0));
}

// Whenever the saving process dies, the project is the old one or the new one, whole.
TEST_F(KfsProject, AKilledSaveLeavesTheOldFileOrTheNewOne)
{
    std::string const slower = folder_.Path("slower");
    ASSERT_EQ(0, RunKfs({"import", Sample, "-o", slower, "--time-scale", "600000"}).code);
    std::string const contents[] = {FileContent(project_), FileContent(slower)};
    ASSERT_TRUE(contents[0] != contents[1]);
    std::string const target = folder_.Path("target");
    ASSERT_EQ(0, RunKfs({"save-as", project_, "-o", target}).code);
    std::mt19937 random(1);
    for (int round = 0; round < 40; ++round) {
        SCOPED_TRACE(round);
        KillWhileSaving(round % 2 ? project_ : slower, target, std::chrono::microseconds(random() % 40000));
        std::string const found = FileContent(target);
        ASSERT_TRUE(found == contents[0] || found == contents[1]) << found.size() << " bytes";
    }
    EXPECT_EQ(0, RunKfs({"save-as", slower, "-o", target}).code) << "what a dead process left is in nobody's way";
    EXPECT_TRUE(contents[1] == FileContent(target));
    for (std::string const& name : folder_.Names()) EXPECT_EQ(name.npos, name.find(".saving-")) << name;
}

// The format, byte for byte: a change of it is a decision, and shows in the dump that stands beside the file.
TEST_F(KfsProject, TheSamplesBytesAndTheirDumpAreTheGoldenOnes)
{
    std::string const golden = kfstest::SourceFolder() / "tests/cli/golden/bouncing_ball";
    EXPECT_TRUE(FileContent(golden + ".project") == FileContent(project_));
    EXPECT_EQ(FileContent(golden + ".txt"), RunKfs({"dump", golden + ".project"}).output);
}

// Projects from before the leaves of scenes had classes and records of their own.
TEST_F(KfsProject, AnEarlierProjectAnswersAsEverAndIsSavedAsOneOfToday)
{
    std::string const earlier = kfstest::SourceFolder() / "tests/cli/golden/bouncing_ball_without_records.project";
    Outcome const same = RunKfs({"diff", earlier, Sample});
    EXPECT_EQ(0, same.code) << same.output << same.errors;
    for (std::string const format : {"csv", "table"}) {
        std::vector<std::string> const eval{"eval", "--raw", "--fps", "30", "--format", format};
        auto const of = [&](std::string const& file) {
            std::vector<std::string> words = eval;
            words.push_back(file);
            return RunKfs(words);
        };
        EXPECT_EQ(of(Sample).output, of(earlier).output);
        EXPECT_EQ("", of(earlier).errors);
    }
    Outcome const saved = RunKfs({"save-as", earlier, "-o", "-"});
    EXPECT_TRUE(FileContent(project_) == saved.output) << saved.errors;
}

// There and back: the keys are those that were, and in between all commands see the same motion.
TEST_F(KfsProject, SeparatesAndJoins)
{
    std::string const golden = kfstest::SourceFolder() / "tests/cli/golden/bouncing_ball_separated";
    std::string const apart = folder_.Path("apart");
    Outcome const separated =
        RunKfs({"separate", project_, "--stream", "*/translation", "-o", apart, "--tolerance", "0"});
    EXPECT_EQ("0 " + apart + ": 1 stream separated\n", std::to_string(separated.code) + ' ' + separated.output);
    EXPECT_EQ("", separated.errors);
    EXPECT_TRUE(FileContent(golden + ".project") == FileContent(apart));
    EXPECT_EQ(FileContent(golden + ".txt"), RunKfs({"dump", apart}).output);
    EXPECT_TRUE(FileContent(apart) == RunKfs({"save-as", apart, "-o", "-"}).output);

    for (std::vector<std::string> command : {std::vector<std::string>{"eval", "--fps", "30"},
                                             {"eval", "--rate", "--format", "csv"},
                                             {"eval", "--as", "spatial"},
                                             {"eval", "--as", "spatial", "--rove"}}) {
        command.insert(command.end(), {"--stream", "*/translation", project_});
        Outcome const whole = RunKfs(command);
        command.back() = apart;
        EXPECT_EQ(whole.output, RunKfs(command).output);
    }
    std::string const y = RunKfs({"eval", apart, "--stream", "*/y", "--to", "1/24", "--format", "csv"}).output;
    EXPECT_TRUE(y.starts_with("frame,seconds,bounce/ball/translation/y.y\n0,0,1.2262500524520874\n")) << y;
    std::string const svg = RunKfs({"plot", apart, "--stream", "*/translation", "-o", "-"}).output;
    EXPECT_EQ(6U, Count(svg, "<polyline"));
    EXPECT_EQ(0, RunKfs({"plot", apart, "--motion", "-o", "-"}).code);
    EXPECT_EQ("~ bounce/ball/translation: curves of x y z | curves of x y z, separated\n"
              "+ bounce/ball/translation/x\n+ bounce/ball/translation/y\n+ bounce/ball/translation/z\n",
              RunKfs({"diff", project_, apart}).output);
    EXPECT_EQ(0, RunKfs({"diff", apart, apart}).code);
    std::string const info = RunKfs({"info", apart, "--stream", "*/translation*"}).output;
    for (char const* const row :
         {"translation          3  x y z       -      -       0 0 0    yes           -      0   2.5  spline\n",
          "translation          1  y           -      -       0        dimension     6      0   2.5  spline\n"})
        EXPECT_NE(std::string::npos, info.find(row)) << info;

    std::string const together = folder_.Path("together");
    Outcome const joined = RunKfs({"join", apart, "--stream", "*/translation*", "-o", together});
    EXPECT_EQ("0 " + together + ": 1 stream joined\n", std::to_string(joined.code) + ' ' + joined.output);
    EXPECT_EQ("", joined.errors);
    EXPECT_EQ("", RunKfs({"diff", project_, together}).output);
}

TEST_F(KfsProject, AnswersLikeTheFileThatItWasImportedFrom)
{
    std::vector<std::vector<std::string>> const commands{{"info"},
                                                         {"eval", "--format", "json", "--fps", "30"},
                                                         {"eval", "--as", "spatial", "--stream", "*translation"},
                                                         {"plot", "-o", "-"}};
    for (std::vector<std::string> command : commands) {
        SCOPED_TRACE(command.front());
        command.push_back(Sample);
        Outcome const expected = RunKfs(command);
        EXPECT_EQ(0, expected.code) << expected.errors;
        command.back() = project_;
        Outcome const found = RunKfs(command);
        EXPECT_EQ("", found.errors);
        std::string output = found.output;
        // The file's name stands in what a JSON answer says of itself.
        for (std::size_t at = 0; (at = output.find(project_)) != std::string::npos;)
            output.replace(at, project_.size(), Sample);
        EXPECT_TRUE(expected.output == output) << found.output;
    }
}

TEST_F(KfsProject, DiffTellsWhatFirstDiffers)
{
    Outcome const same = RunKfs({"diff", Sample, project_});
    EXPECT_EQ(0, same.code) << same.errors;
    EXPECT_EQ("", same.output);

    std::string const bytes = FileContent(project_);
    std::size_t const keys = bytes.find("seql");  // of the translation: head of 16 bytes, then keys of 128
    ASSERT_NE(std::string::npos, keys);
    std::size_t const second = keys + 16 + 128;
    auto const diffWith = [&](std::size_t offset, std::string const& with) {
        std::string changed = bytes;
        changed.replace(offset, with.size(), with);
        Outcome const outcome = RunKfs({"diff", project_, folder_.Write("changed", changed)});
        EXPECT_EQ(1, outcome.code) << outcome.errors;
        return outcome.output;
    };
    std::string const path = "~ bounce/ball/translation: ";
    EXPECT_EQ(path + "key 1: 1/2 s | 1/120000 s\n", diffWith(second, std::string("\0\0\0\1", 4)));
    EXPECT_EQ(path + "curves of x y z | curves of a y z\n", diffWith(bytes.find("khco") + 8, "a"));
    EXPECT_EQ("- bounce/ball/translation\n- bounce/ball/rotation\n- bounce/ball/scale\n"
              "+ BOUNCE/ball/translation\n+ BOUNCE/ball/rotation\n+ BOUNCE/ball/scale\n",
              diffWith(bytes.find("bounce"), "BOUNCE"));
    // Another first value of the second key, and then another first speed, which only shows between the keys.
    std::string const value = diffWith(second + 8, "\x40\x22");
    EXPECT_TRUE(value.starts_with(path + "key 1 at 1/2 s: ")) << value;
    std::string const speed = diffWith(second + 8 + 24, "\x40\x59");
    EXPECT_TRUE(speed.starts_with(path + "between keys at 1/4 s: ")) << speed;
}

TEST_F(KfsProject, DumpShowsTheChunks)
{
    Outcome const outcome = RunKfs({"dump", project_});
    EXPECT_EQ(0, outcome.code);
    EXPECT_EQ("", outcome.errors);
    for (char const* const line :
         {"       0  KFSF proj [", "\n      12    vers [12] version 95.0, encoding 0\n",
          "khti [16] 1/120000 s, exact, off by up to ", "kfsn [13] \"bouncing_ball\"\n",
          "kfmn [40] \"KFS Animation\"\n", "kfsn [6] \"bounce\"\n", "kfb4 [124] dimension 4, 1/120000 s, keys\n",
          "] 6 keys of 128 bytes, times 0 to 300000\n", "khin [4] 2\n", "khco [7] \"x y z w\"\n"})
        EXPECT_NE(std::string::npos, outcome.output.find(line)) << line << "in\n" << outcome.output;
}

TEST_F(KfsProject, DumpShowsWhatIsWrong)
{
    std::string const bytes = FileContent(project_);
    for (std::size_t const size : {std::size_t{0}, std::size_t{3}, std::size_t{30}, bytes.size() - 1}) {
        Outcome const outcome = RunKfs({"dump", folder_.Write("cut", bytes.substr(0, size))});
        EXPECT_EQ(1, outcome.code) << size;
        EXPECT_EQ("", outcome.errors);
        EXPECT_NE(std::string::npos, outcome.output.find("  <-- ")) << size << ": " << outcome.output;
    }
    // The walk goes on behind a list that claims too much.
    std::string wrong = bytes;
    std::size_t const leaf = wrong.find("kfbs");
    ASSERT_NE(std::string::npos, leaf);
    wrong.replace(leaf - 4, 4, "\x7F\xFF\xFF\xFF");
    Outcome const outcome = RunKfs({"dump", folder_.Write("wrong", wrong)});
    EXPECT_EQ(1, outcome.code);
    EXPECT_NE(std::string::npos, outcome.output.find("khch")) << outcome.output;
}

}  // namespace
