#include "host/projectfile.h"
#include "tests/host/hosttest.h"
#include "tests/support/scratchfolder.h"

#include <algorithm>
#include <csignal>
#include <random>
#include <utility>

#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

using kfshost::Scene;
using kfshost::StreamItem;

namespace {

Scene SceneOfKeys(int keys)
{
    StreamItem item;
    item.animation = "walk";
    item.node = "ball";
    item.kind = kfshost::StreamKind::Weights;
    item.components = {"w"};
    item.path = kfshost::PathOf(item);
    kfshost::StreamBuilder builder(1, 24, item.path);
    for (int i = 0; i < keys; ++i) {
        double const value = i * 0.5;
        builder.Append(i, &value, KFS_Interp_Linear, KFS_Interp_Linear);
    }
    item.stream = builder.Take();
    Scene scene;
    scene.name = "scene";
    scene.timeScale = 24;
    scene.streams.push_back(std::move(item));
    return scene;
}

// What a save says in a process whose files may have so many bytes; nothing if it is done.
std::string FailureWithin(std::size_t limit, kfshost::SceneGroup const& tree, std::string const& target)
{
    int ends[2];
    if (pipe(ends) != 0) throw std::runtime_error("no pipe for the test");
    pid_t const child = fork();
    if (child == 0) {
        std::signal(SIGXFSZ, SIG_IGN);  // so that the write fails instead
        rlimit const size{limit, limit};
        setrlimit(RLIMIT_FSIZE, &size);
        std::string failure;
        try {
            kfshost::SaveProject(tree, target);
        } catch (kfshost::ProjectError const& error) {
            failure = error.what();
        }
        bool const told = write(ends[1], failure.data(), failure.size()) == static_cast<ssize_t>(failure.size());
        _exit(told ? 0 : 1);
    }
    close(ends[1]);
    std::string failure(4096, '\0');
    failure.resize(static_cast<std::size_t>(std::max<ssize_t>(0, read(ends[0], failure.data(), failure.size()))));
    close(ends[0]);
    int status = -1;
    EXPECT_EQ(child, waitpid(child, &status, 0));
    EXPECT_EQ(0, status);
    return failure;
}

class FullDisk : public HostTest {
protected:
    // A save finds room for `limit` bytes of the new file only.
    void ExpectTheOldFile(std::size_t limit, kfshost::SceneGroup const& tree)
    {
        ASSERT_EQ(target_ + ": can't be saved: can't write \"" + target_ + "\": File too large",
                  FailureWithin(limit, tree, target_))
            << limit;
        ASSERT_EQ("the old one", FileContent(target_)) << limit;
        ASSERT_EQ(std::set<std::string>{"project"}, folder_.Names()) << limit;
    }
    static std::string BytesOf(kfshost::SceneGroup const& tree)
    {
        ScratchFolder const folder;
        kfshost::SaveProject(tree, folder.Path("whole"));
        return FileContent(folder.Path("whole"));
    }

    ScratchFolder folder_;
    std::string const target_ = std::filesystem::canonical(folder_.Write("project", "the old one"));
};

// Wherever the disk is full.
TEST_F(FullDisk, AtAnyByte)
{
    auto const tree = kfshost::MakeTree(SceneOfKeys(2));
    std::string const whole = BytesOf(*tree);
    for (std::size_t limit = 0; limit < whole.size(); ++limit) ASSERT_NO_FATAL_FAILURE(ExpectTheOldFile(limit, *tree));
    EXPECT_EQ("", FailureWithin(whole.size(), *tree, target_));
    EXPECT_TRUE(whole == FileContent(target_));
}

// A file that is written in several pieces.
TEST_F(FullDisk, BetweenThePieces)
{
    auto const tree = kfshost::MakeTree(SceneOfKeys(6000));
    std::string const whole = BytesOf(*tree);
    ASSERT_GT(whole.size(), 4u * 65536);
    std::vector<std::size_t> limits{0, 1, 65535, 65536, 65537, 131072, whole.size() - 1};
    std::mt19937 random(5);
    std::generate_n(std::back_inserter(limits), 10, [&] { return random() % whole.size(); });
    for (std::size_t const limit : limits) ASSERT_NO_FATAL_FAILURE(ExpectTheOldFile(limit, *tree));
    EXPECT_EQ("", FailureWithin(whole.size(), *tree, target_));
    EXPECT_TRUE(whole == FileContent(target_));
}

}  // namespace
