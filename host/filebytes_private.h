#pragma once

#include <cstddef>
#include <cstdio>
#include <memory>
#include <string>

namespace kfshost {

// A file on its way into memory: a regular file, a pipe, a device, or the standard input, which is called "-". It is
// read once, front to back.
class FileReader {
public:
    // `place` begins what ImportError says when the file can't be opened or read.
    FileReader(std::string const& fileName, std::string place);

    // The first bytes of the file, or all of a shorter one: enough to judge what it is.
    std::string const& Head() const { return bytes_; }
    // All of it, at most `most` bytes.
    std::string Take(std::size_t most);

private:
    void ReadUpTo(std::size_t size);

    std::string place_;
    std::unique_ptr<std::FILE, int (*)(std::FILE*)> file_;
    std::string bytes_;
};

// A file's bytes; at most `most` of them. Throws ImportError with `place` when it can't be read.
std::string ReadFileBytes(std::string const& fileName, std::string const& place, std::size_t most);

}  // namespace kfshost
