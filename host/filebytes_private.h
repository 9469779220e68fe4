#pragma once

#include <string>

namespace kfshost {

// A file's bytes; at most `most` of them. Throws ImportError with `place` when it can't be read.
std::string ReadFileBytes(std::string const& fileName, std::string const& place, std::size_t most);

}  // namespace kfshost
