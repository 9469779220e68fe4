#include "tests/cli/command.h"
#include "tests/support/places.h"

#include <stdexcept>

#include <fcntl.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

int Spawn(std::vector<std::string> const& arguments, std::string const& output, std::string const& errors)
{
    std::vector<char*> pointers;
    std::string command = kfstest::Command();
    pointers.push_back(command.data());
    for (std::string const& argument : arguments) pointers.push_back(const_cast<char*>(argument.c_str()));
    pointers.push_back(nullptr);

    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_addopen(&actions, STDIN_FILENO, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&actions, STDOUT_FILENO, output.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
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

Outcome RunKfs(std::vector<std::string> const& arguments, std::string const& output)
{
    ScratchFolder const folder;
    std::string const out = output.empty() ? folder.Path("output") : output;
    Outcome outcome;
    outcome.code = Spawn(arguments, out, folder.Path("errors"));
    outcome.output = output.empty() ? FileContent(out) : "";
    outcome.errors = FileContent(folder.Path("errors"));
    return outcome;
}
