#pragma once

#include "cli/selection.h"
#include "cli/usererror.h"
#include "host/rational.h"

#include <CLI/CLI.hpp>

#include <stdexcept>
#include <string>

// Options that several commands have.

// The file, which streams of it, and in which form.
void AddSelection(CLI::App& command, Selection& selection);
void AddTimeScale(CLI::App& command, unsigned int& timeScale);
CLI::Option* AddOutput(CLI::App& command, std::string& output, std::string const& what, std::string const& typeName);

// A number within both bounds, which "nan" isn't. An infinite one is none.
CLI::Validator NumberCheck(double least, double most);

// Does arithmetic that only an option's odd number can take beyond what a fraction holds. Throws UserError then.
template <class Work>
auto Fitting(char const* option, Work const& work)
{
    try {
        return work();
    } catch (std::overflow_error const&) {
        throw UserError(option, "leads to times that don't fit fractions of 64 bits");
    }
}

// "24" or "30000/1001", above 0. Throws UserError.
kfshost::Rational ParseFps(std::string const& text);

// Seconds like 0.5 or 1/24, or frames with an "f" behind. Throws UserError, with the option's name.
kfshost::Rational ParseTime(std::string const& text, char const* option, kfshost::Rational const& fps);
