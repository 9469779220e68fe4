#include "cli/output.h"

#include "cli/usererror.h"
#include "frame/services/filewriter.h"

#include <fmt/format.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>

std::string Plural(std::size_t count, std::string_view one, std::string_view many)
{
    return fmt::format("{} {}", count, count == 1 ? one : many);
}

std::string Shown(std::string_view text)
{
    std::string shown;
    for (char const c : text) {
        auto const code = static_cast<unsigned char>(c);
        if (c == '\n')
            shown += "\\n";
        else if (c == '\t')
            shown += "\\t";
        else if (code < 0x20 || code == 0x7F)
            shown += fmt::format("\\x{:02x}", code);
        else
            shown += c;
    }
    return shown;
}

void RefuseToOverwrite(std::string const& input, std::string const& output)
{
    std::error_code ignored;
    if (output != "-" && std::filesystem::equivalent(input, output, ignored))
        throw UserError("-o", '"' + output + "\" is the file that is read");
}

void WriteToStandardOutput(std::string_view text, std::string const& done)
{
    if (std::fwrite(text.data(), 1, text.size(), stdout) == text.size() && std::fflush(stdout) == 0) return;
    std::string const reason = std::strerror(errno);
    throw UserError("standard output", "can't be written: " + reason + (done.empty() ? "" : " (" + done + ')'));
}

void WriteWholeFile(std::string const& fileName, std::string_view bytes)
{
    if (fileName == "-") {
        WriteToStandardOutput(bytes);
        return;
    }
    CKF_FileWriter file;
    file.Create(fileName.c_str(), CKF_Target::FileOrStream);
    file.Append(bytes.data(), bytes.size());
    if (int const reason = file.Commit())
        throw UserError(fileName, std::string("can't be written: ") + std::strerror(reason));
}
