#pragma once

#include "tests/support/places.h"
#include "tests/support/scratchfolder.h"

#include <map>
#include <string>

// Small files of all kinds and shapes, by name: what fuzzing begins with, and what the hostile tests damage.
// `target`: a folder of fuzz/corpus. New ones are saved by `kfs import` or found by fuzzing.
inline std::map<std::string, std::string> Samples(std::string const& target)
{
    std::map<std::string, std::string> samples;
    for (auto const& entry : std::filesystem::directory_iterator(kfstest::SourceFolder() / "fuzz/corpus" / target))
        samples.emplace(entry.path().filename().string(), FileContent(entry.path().string()));
    return samples;
}
