#include "host/filebytes_private.h"

#include "host/import_error.h"

#include <algorithm>
#include <cerrno>
#include <cstring>

#include <sys/stat.h>

namespace kfshost {

namespace {

constexpr std::size_t HeadSize = 4096;
constexpr std::size_t BlockSize = 1 << 20;

std::FILE* OpenFile(std::string const& fileName, std::string const& place)
{
    errno = 0;
    std::FILE* const file = fileName == "-" ? stdin : std::fopen(fileName.c_str(), "rb");
    if (!file) throw ImportError(place, std::string("can't be opened: ") + std::strerror(errno));
    return file;
}

int KeepOpen(std::FILE*)
{
    return 0;
}

// How many bytes a regular file has; 0 for what only its end tells.
std::size_t SizeOf(std::FILE* file)
{
    struct stat status {};
    bool const isKnown = fstat(fileno(file), &status) == 0 && S_ISREG(status.st_mode) && status.st_size > 0;
    return isKnown ? static_cast<std::size_t>(status.st_size) : 0;
}

}  // namespace

FileReader::FileReader(std::string const& fileName, std::string place)
    : place_(std::move(place)),
      file_(OpenFile(fileName, place_), fileName == "-" ? KeepOpen : std::fclose)
{
    ReadUpTo(HeadSize);
}

// Straight into its place, so that a file is in memory once and not twice.
void FileReader::ReadUpTo(std::size_t size)
{
    while (bytes_.size() < size) {
        std::size_t const before = bytes_.size();
        bytes_.resize(before + std::min(BlockSize, size - before));
        errno = 0;
        std::size_t const got = std::fread(bytes_.data() + before, 1, bytes_.size() - before, file_.get());
        bytes_.resize(before + got);
        if (got == 0) break;
    }
    if (std::ferror(file_.get())) throw ImportError(place_, std::string("can't be read: ") + std::strerror(errno));
}

std::string FileReader::Take(std::size_t most)
{
    bytes_.reserve(std::min(std::max(SizeOf(file_.get()), bytes_.size()), most));
    ReadUpTo(most);
    bytes_.resize(std::min(bytes_.size(), most));
    return std::move(bytes_);
}

std::string ReadFileBytes(std::string const& fileName, std::string const& place, std::size_t most)
{
    return FileReader(fileName, place).Take(most);
}

}  // namespace kfshost
