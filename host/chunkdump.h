#pragma once

#include <cstddef>
#include <string>

namespace kfshost {

// A project file as text, a line for each chunk: its offset, its id or list type, its length, and what stands in it.
struct ChunkDump {
    std::string text;
    std::size_t problems = 0;  // chunks with which something is wrong; their lines say what
};

// Of any file, however broken; "-" is the standard input. Throws ImportError when it can't be read.
ChunkDump DumpChunks(std::string const& fileName);

}  // namespace kfshost
