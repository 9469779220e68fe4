#include "tests/cli/command.h"
#include "tests/support/places.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <stdexcept>

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

int Spawn(std::vector<std::string> const& arguments, Streams const& streams, std::string const& errors)
{
    std::vector<char*> pointers;
    std::string command = kfstest::Command();
    pointers.push_back(command.data());
    for (std::string const& argument : arguments) pointers.push_back(const_cast<char*>(argument.c_str()));
    pointers.push_back(nullptr);

    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, streams.input.c_str(), O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, streams.output.c_str(), O_WRONLY | O_CREAT | O_TRUNC,
                                     0600);
    posix_spawn_file_actions_addopen(&actions, STDERR_FILENO, errors.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
    pid_t child = 0;
    int const failed = posix_spawn(&child, command.c_str(), &actions, nullptr, pointers.data(), environ);
    posix_spawn_file_actions_destroy(&actions);
    int status = 0;
    if (failed != 0 || waitpid(child, &status, 0) != child)
        throw std::runtime_error("the command can't be run: " + command);
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

}  // namespace

Outcome RunKfs(std::vector<std::string> const& arguments, Streams const& streams)
{
    ScratchFolder const folder;
    bool const isKept = streams.output.empty();
    Outcome outcome;
    outcome.code =
        Spawn(arguments, {streams.input, isKept ? folder.Path("output") : streams.output}, folder.Path("errors"));
    outcome.output = isKept ? FileContent(folder.Path("output")) : "";
    outcome.errors = FileContent(folder.Path("errors"));
    return outcome;
}

void ExpectGolden(std::string const& name, std::string const& text)
{
    std::string const file = kfstest::SourceFolder() / "tests/cli/golden" / name;
    if (std::getenv("KFS_WRITE_GOLDEN")) std::ofstream(file, std::ios::binary) << text;
    std::string const golden = FileContent(file);
    auto const [ours, theirs] = std::mismatch(text.begin(), text.end(), golden.begin(), golden.end());
    EXPECT_TRUE(text == golden) << name << " differs from line " << 1 + std::count(text.begin(), ours, '\n')
                                << " on; with KFS_WRITE_GOLDEN=1 it is written anew, and git shows what changed";
}
