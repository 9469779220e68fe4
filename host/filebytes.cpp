#include "host/filebytes_private.h"

#include "host/import_error.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <memory>

namespace kfshost {

std::string ReadFileBytes(std::string const& fileName, std::string const& place, std::size_t most)
{
    errno = 0;
    std::unique_ptr<std::FILE, int (*)(std::FILE*)> const file(std::fopen(fileName.c_str(), "rb"), std::fclose);
    if (!file) throw ImportError(place, std::string("can't be opened: ") + std::strerror(errno));
    std::string bytes;
    std::string block(1 << 20, '\0');
    while (bytes.size() < most) {
        std::size_t const got = std::fread(block.data(), 1, std::min(block.size(), most - bytes.size()), file.get());
        if (got == 0) break;
        bytes.append(block, 0, got);
    }
    if (std::ferror(file.get())) throw ImportError(place, std::string("can't be read: ") + std::strerror(errno));
    return bytes;
}

}  // namespace kfshost
