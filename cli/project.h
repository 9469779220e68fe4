#pragma once

#include <CLI/CLI.hpp>

#include <string>

struct ProjectOptions {
    std::string file;
    std::string other;  // what `file` is compared with
    std::string output;
    unsigned int timeScale = 0;
};

// What --time-scale may be.
CLI::Validator TimeScaleCheck();

// The commands that make project files and look into them: import, save-as, dump and diff.
void AddProjectCommands(CLI::App& app, ProjectOptions& options);
