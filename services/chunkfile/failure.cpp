#include "services/chunkfile/failure_private.h"

#include "frame/services/chunkfile.h"
#include "frame/services/memory.h"

#include <cstdarg>
#include <cstdio>
#include <string>
#include <system_error>

void CKFp_DescribeIo(char* text, std::size_t size, int error, char const* what, char const* path) noexcept
{
    std::string reason;
    try {
        reason = std::generic_category().message(error);
    } catch (std::exception const&) {  // out of memory: the sentence goes without
    }
    std::snprintf(text, size, "can't %s \"%s\": %s", what, path, reason.c_str());
}

int CKFp_Failure::Set(int code, std::uint64_t offset, char const* format, ...) noexcept
{
    if (code_ != 0) return code_;
    code_ = code;
    offset_ = offset;
    std::va_list arguments;
    va_start(arguments, format);
    std::vsnprintf(text_, sizeof text_, format, arguments);
    va_end(arguments);
    return code_;
}

int CKFp_Failure::SetIo(int error, std::uint64_t offset, char const* what, char const* path) noexcept
{
    char text[sizeof text_];
    CKFp_DescribeIo(text, sizeof text, error, what, path);
    return Set(CKF_Err_Io, offset, "%s", text);
}

int CKFp_Failure::SetOutOfMemory(std::uint64_t offset) noexcept
{
    return Set(Q_Err_OutOfMemory, offset, "not enough memory for the project");
}

int CKFp_Failure::SetBadAtomId(int id, std::uint64_t offset) noexcept
{
    return Set(CKF_Err_BadArgument, offset, "\"%s\" can't be the id of an atom", CKFp_IdText(id).text);
}

CKFp_IdText::CKFp_IdText(int id) noexcept
{
    for (int i = 0; i < 4; ++i) {
        unsigned const byte = (static_cast<unsigned>(id) >> (24 - 8 * i)) & 0xFF;
        text[i] = byte >= 0x20 && byte < 0x7F ? static_cast<char>(byte) : '?';
    }
    text[4] = 0;
}
