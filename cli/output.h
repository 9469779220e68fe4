#pragma once

#include "frame/services/filewriter.h"

#include <string>
#include <string_view>

// A count with its noun.
std::string Plural(std::size_t count, std::string_view one, std::string_view many);

// Text from elsewhere, such as a file's name, as it can be put into a line: control characters stand as "\n" or "\x1b".
std::string Shown(std::string_view text);

// Throws UserError, with the option's name, where a result would be written over the file that it is made from.
void RefuseToOverwrite(std::string const& input, std::string const& output, char const* option = "-o");

// Writes a whole text to the standard output. `done`: what the command has brought about already and the user is to
// know if that fails. Throws UserError.
void WriteToStandardOutput(std::string_view text, std::string const& done = "");

// Text on its way to the standard output, in large pieces, so that what is long isn't held in memory.
class Output {
public:
    void Add(std::string_view text);
    void Flush();

private:
    std::string text_;
};

// A text as a cell of CSV, and as JSON.
std::string CsvCell(std::string const& text);
std::string Quoted(std::string_view text);

// A whole file, or none: an earlier file of that name is replaced only by a complete one, and not before Commit. Pipes
// and devices are written to, and "-" is the standard output. Both throw UserError.
class WholeFile {
public:
    WholeFile(std::string fileName, std::string bytes);
    void Commit();

private:
    void ThrowIfFailed(int reason) const;

    std::string fileName_;
    std::string bytes_;  // what goes to the standard output
    CKF_FileWriter file_;
};

// The same at once.
void WriteWholeFile(std::string const& fileName, std::string_view bytes);
