#include "cli/output.h"

#include "cli/usererror.h"

#include <fmt/format.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>

#include <unistd.h>

namespace {

bool WriteAndClose(std::FILE* file, std::string_view text)
{
    bool const written = std::fwrite(text.data(), 1, text.size(), file) == text.size();
    return std::fclose(file) == 0 && written;
}

[[noreturn]] void Fail(std::string const& fileName)
{
    throw UserError(fileName, std::string("can't be written: ") + std::strerror(errno));
}

}  // namespace

std::string Plural(std::size_t count, std::string_view one, std::string_view many)
{
    return fmt::format("{} {}", count, count == 1 ? one : many);
}

void RefuseToOverwrite(std::string const& input, std::string const& output)
{
    std::error_code ignored;
    if (output != "-" && std::filesystem::equivalent(input, output, ignored))
        throw UserError("-o", '"' + output + "\" is the file that is read");
}

void WriteToStandardOutput(std::string_view text)
{
    if (std::fwrite(text.data(), 1, text.size(), stdout) != text.size() || std::fflush(stdout) != 0)
        Fail("standard output");
}

void WriteWholeFile(std::string const& fileName, std::string_view text)
{
    if (fileName == "-") {
        WriteToStandardOutput(text);
        return;
    }
    std::error_code ignored;
    auto const status = std::filesystem::status(fileName, ignored);
    bool const isDevice = std::filesystem::exists(status) && !std::filesystem::is_regular_file(status);
    std::string const target = isDevice ? fileName : fileName + ".part" + std::to_string(getpid());
    std::FILE* const file = std::fopen(target.c_str(), "wb");
    if (!file) Fail(fileName);
    bool const written = WriteAndClose(file, text);
    if (isDevice ? !written : !written || std::rename(target.c_str(), fileName.c_str()) != 0) {
        int const reason = errno;
        if (!isDevice) std::remove(target.c_str());
        errno = reason;
        Fail(fileName);
    }
}
