#pragma once

#include <CLI/CLI.hpp>

#include <string>

struct ProjectOptions {
    std::string file;
    std::string output;
    unsigned int timeScale = 0;
};

// The commands that make project files and look into them: import and dump.
void AddProjectCommands(CLI::App& app, ProjectOptions& options);
