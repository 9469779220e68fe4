#pragma once

#include <string>
#include <string_view>

// Writes a whole text to the standard output. Throws UserError.
// A count with its noun.
std::string Plural(std::size_t count, std::string_view one, std::string_view many);

// Throws UserError where a result would be written over the file that it is made from.
void RefuseToOverwrite(std::string const& input, std::string const& output);

void WriteToStandardOutput(std::string_view text);

// Writes a whole file, or none: an earlier file of that name is replaced only by a complete one. "-" is the standard
// output. Throws UserError.
void WriteWholeFile(std::string const& fileName, std::string_view text);
