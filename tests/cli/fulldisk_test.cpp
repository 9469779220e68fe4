#include "tests/cli/command.h"
#include "tests/support/places.h"

#include <gtest/gtest.h>

#include <csignal>
#include <fstream>

#include <fcntl.h>
#include <sched.h>
#include <sys/mount.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

// What a piece of work in a process of its own writes to its end of a pipe, and that process's exit code in `code`.
template <class Work>
std::string InAnotherProcess(Work const& work, int* code)
{
    int ends[2];
    if (pipe(ends) != 0) throw std::runtime_error("no pipe for the test");
    pid_t const child = fork();
    if (child == 0) {
        close(ends[0]);
        _exit(work(ends[1]));
    }
    close(ends[1]);
    std::string text;
    char buffer[4096];
    for (ssize_t got = 0; (got = read(ends[0], buffer, sizeof buffer)) > 0;)
        text.append(buffer, static_cast<std::size_t>(got));
    close(ends[0]);
    int status = 0;
    EXPECT_EQ(child, waitpid(child, &status, 0));
    *code = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    return text;
}

class KfsFullDisk : public testing::Test {
protected:
    void SetUp() override
    {
        for (auto const& [frames, project] : {std::pair{2U, old_}, std::pair{4000U, new_}})
            ASSERT_EQ(0,
                      RunKfs({"import",
                              folder_.Write("animation.bvh", Motion(std::vector<std::string>(frames, "1 0 1"), "0.04")),
                              "-o", project})
                          .code);
        std::filesystem::remove(folder_.Path("animation.bvh"));
    }

    ScratchFolder folder_;
    std::string const old_ = folder_.Path("old");
    std::string const new_ = folder_.Path("new");
};

// The process may not write files of more than so many bytes.
TEST_F(KfsFullDisk, ALimitOfTheProcess)
{
    std::size_t const size = FileContent(new_).size();
    ASSERT_GT(size, 4u * 65536);
    ScratchFolder const place;
    std::string const target = std::filesystem::canonical(place.Write("project", FileContent(old_)));
    std::string const refusal = "kfs: " + target + ": can't be saved: can't write \"" + target + "\": File too large\n";
    for (std::size_t const limit :
         {std::size_t{0}, std::size_t{1}, std::size_t{4096}, std::size_t{65536}, std::size_t{100000}, size - 1, size}) {
        SCOPED_TRACE(limit);
        int code = -1;
        std::string const errors = InAnotherProcess(
            [&](int end) {
                std::signal(SIGXFSZ, SIG_IGN);  // so that the write fails instead
                rlimit const most{limit, limit};
                setrlimit(RLIMIT_FSIZE, &most);
                dup2(end, STDERR_FILENO);
                dup2(open("/dev/null", O_WRONLY), STDOUT_FILENO);
                execl(kfstest::Command(), kfstest::Command(), "save-as", new_.c_str(), "-o", target.c_str(), nullptr);
                return 127;
            },
            &code);
        bool const fits = limit == size;
        EXPECT_EQ(fits ? 0 : 2, code);
        EXPECT_EQ(fits ? "" : refusal, errors);
        EXPECT_TRUE(FileContent(fits ? new_ : old_) == FileContent(target));
        EXPECT_EQ(std::set<std::string>{"project"}, place.Names());
    }
}

constexpr int NotPermitted = 77;

bool WriteText(char const* file, std::string const& text)
{
    std::ofstream stream(file);
    return static_cast<bool>(stream << text << std::flush);
}

// A file system of 64 KiB in the folder, which this process alone sees. False where a process may not have that.
bool MountSmallDisk(std::string const& folder)
{
    std::string const user = "0 " + std::to_string(geteuid()) + " 1";
    std::string const group = "0 " + std::to_string(getegid()) + " 1";
    return unshare(CLONE_NEWUSER | CLONE_NEWNS) == 0 && WriteText("/proc/self/setgroups", "deny") &&
           WriteText("/proc/self/uid_map", user) && WriteText("/proc/self/gid_map", group) &&
           mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0 &&
           mount("kfs", folder.c_str(), "tmpfs", 0, "size=64k") == 0;
}

// A disk with room for the old file, but not for the new one beside it.
TEST_F(KfsFullDisk, ADiskWithoutRoom)
{
    ScratchFolder const place;
    std::string const folder = std::filesystem::canonical(place.Path(""));
    std::string const target = folder + "/project";
    int code = -1;
    std::string const found = InAnotherProcess(
        [&](int end) {
            if (!MountSmallDisk(folder)) return NotPermitted;
            std::string const before = FileContent(old_);
            place.Write("project", before);
            Outcome const outcome = RunKfs({"save-as", new_, "-o", target});
            bool const isOld = FileContent(target) == before;
            std::size_t const files = place.Names().size();
            Outcome const again = RunKfs({"save-as", old_, "-o", target});
            std::string const text = std::to_string(outcome.code) + ' ' + outcome.errors +
                                     (isOld ? "the old file" : "another file") + ", " + std::to_string(files) +
                                     " in the folder, then " + std::to_string(again.code) + again.errors;
            return write(end, text.data(), text.size()) == static_cast<ssize_t>(text.size()) ? 0 : 1;
        },
        &code);
    if (code == NotPermitted) GTEST_SKIP() << "this process may not mount a file system of its own";
    EXPECT_EQ(0, code);
    EXPECT_EQ("2 kfs: " + target + ": can't be saved: can't write \"" + target +
                  "\": No space left on device\nthe old file, 1 in the folder, then 0",
              found);
}

}  // namespace
