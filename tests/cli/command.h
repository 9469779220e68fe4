#pragma once

#include <filesystem>
#include <string>
#include <vector>

// What a run of the command left behind.
struct Outcome {
    int code = -1;  // its exit code; -1 if it ended by a signal
    std::string output;
    std::string errors;
};

// Runs the built command. The arguments need no quoting. `output`: where its standard output goes in place of the
// result.
Outcome RunKfs(std::vector<std::string> const& arguments, std::string const& output = "");

// A folder that goes away with its content.
class ScratchFolder {
public:
    ScratchFolder();
    ~ScratchFolder();
    ScratchFolder(ScratchFolder const&) = delete;
    ScratchFolder& operator=(ScratchFolder const&) = delete;

    std::string Path(std::string const& name) const { return (path_ / name).string(); }
    std::string Write(std::string const& name, std::string const& bytes) const;

private:
    std::filesystem::path path_;
};
