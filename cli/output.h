#pragma once

#include <string>
#include <string_view>

// Writes a whole text to the standard output. Throws UserError.
void WriteToStandardOutput(std::string_view text);

// Writes a whole file, or none: an earlier file of that name is replaced only by a complete one. "-" is the standard
// output. Throws UserError.
void WriteWholeFile(std::string const& fileName, std::string_view text);
