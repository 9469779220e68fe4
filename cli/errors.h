#pragma once

#include "cli/usererror.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/projectfile.h"

#include <functional>
#include <string>
#include <utility>

// Runs what reads a file, and tells what is wrong with the file together with its name.
template <class Read>
auto ReadingFile(std::string const& fileName, Read&& read)
{
    try {
        return std::forward<Read>(read)();
    } catch (kfshost::ImportError const& error) {
        throw UserError(kfshost::ShownFileName(fileName), error.what());
    }
}

// What the user should know beside the result: a line on the standard error.
void TellAbout(std::string const& fileName, std::string const& what);

// Tells what the library changed so that a file could be loaded. The command goes on; its exit code is ExitFound then.
void TellChanges(std::string const& fileName, kfshost::LoadNotes const& notes);

// Keeps what the library reports, for the line that RunTold writes. Of one process's first report.
void ListenToReports();

// Runs the work and answers its exit code. What it throws becomes one line on the standard error, and ExitFailed.
[[nodiscard]] int RunTold(std::function<int()> const& work);
