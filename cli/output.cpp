#include "cli/output.h"

#include "cli/usererror.h"

#include <fmt/format.h>
#include <nlohmann/json.hpp>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <filesystem>
#include <utility>

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

void RefuseToOverwrite(std::string const& input, std::string const& output, char const* option)
{
    std::error_code ignored;
    if (output != "-" && std::filesystem::equivalent(input, output, ignored))
        throw UserError(option, '"' + output + "\" is the file that is read");
}

void WriteToStandardOutput(std::string_view text, std::string const& done)
{
    if (std::fwrite(text.data(), 1, text.size(), stdout) == text.size() && std::fflush(stdout) == 0) return;
    std::string const reason = std::strerror(errno);
    throw UserError("standard output", "can't be written: " + reason + (done.empty() ? "" : " (" + done + ')'));
}

void Output::Add(std::string_view text)
{
    text_ += text;
    constexpr std::size_t piece = 1 << 16;
    if (text_.size() >= piece) Flush();
}

void Output::Flush()
{
    WriteToStandardOutput(text_);
    text_.clear();
}

std::string CsvCell(std::string const& text)
{
    if (text.find_first_of(",\"\n\r") == std::string::npos) return text;
    std::string quoted = "\"";
    for (char const c : text) {
        quoted += c;
        if (c == '"') quoted += c;
    }
    return quoted + '"';
}

std::string Quoted(std::string_view text)
{
    return nlohmann::json(text).dump();
}

WholeFile::WholeFile(std::string fileName, std::string bytes) : fileName_(std::move(fileName)), bytes_(std::move(bytes))
{
    if (fileName_ == "-") return;
    file_.Create(fileName_.c_str(), CKF_Target::FileOrStream);
    ThrowIfFailed(file_.Append(bytes_.data(), bytes_.size()));
}

void WholeFile::Commit()
{
    if (fileName_ == "-")
        WriteToStandardOutput(bytes_);
    else
        ThrowIfFailed(file_.Commit());
}

void WholeFile::ThrowIfFailed(int reason) const
{
    if (reason != 0) throw UserError(fileName_, std::string("can't be written: ") + std::strerror(reason));
}

void WriteWholeFile(std::string const& fileName, std::string_view bytes)
{
    WholeFile(fileName, std::string(bytes)).Commit();
}
