#pragma once

#include <string>
#include <string_view>

// A count with its noun.
std::string Plural(std::size_t count, std::string_view one, std::string_view many);

// Text from elsewhere, such as a file's name, as it can be put into a line: control characters stand as "\n" or "\x1b".
std::string Shown(std::string_view text);

// Throws UserError where a result would be written over the file that it is made from.
void RefuseToOverwrite(std::string const& input, std::string const& output);

// Writes a whole text to the standard output. `done`: what the command has brought about already and the user is to
// know if that fails. Throws UserError.
void WriteToStandardOutput(std::string_view text, std::string const& done = "");

// Writes a whole file, or none: an earlier file of that name is replaced only by a complete one. Pipes and devices are
// written to, and "-" is the standard output. Throws UserError.
void WriteWholeFile(std::string const& fileName, std::string_view bytes);
