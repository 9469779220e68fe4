#include "services/chunkfile/text_private.h"

#include "services/chunkfile/file_private.h"

#include <algorithm>
#include <cstring>
#include <utility>

namespace {

constexpr unsigned char Utf8Mark[3] = {0xEF, 0xBB, 0xBF};

bool IsHigh(unsigned unit) noexcept
{
    return unit >= 0xD800 && unit <= 0xDBFF;
}

bool IsLow(unsigned unit) noexcept
{
    return unit >= 0xDC00 && unit <= 0xDFFF;
}

// The first surrogate without a partner from an index on, or the text's length.
std::size_t FindLoneSurrogate(u16str const& text, std::size_t index) noexcept
{
    for (; index < text.size(); ++index)
        if (IsHigh(text[index]) && index + 1 < text.size() && IsLow(text[index + 1]))
            ++index;
        else if (IsHigh(text[index]) || IsLow(text[index]))
            break;
    return index;
}

// The first three-byte form of a surrogate from an index on, or the number of bytes. A byte ED always begins a
// sequence, so none is found inside another character.
std::size_t FindSurrogateBytes(CKFp_Bytes bytes, std::size_t index) noexcept
{
    for (; index < bytes.size(); ++index)
        if (bytes.size() - index >= 3 && bytes[index] == 0xED && bytes[index + 1] >= 0xA0 && bytes[index + 1] <= 0xBF &&
            bytes[index + 2] >= 0x80 && bytes[index + 2] <= 0xBF)
            break;
    return index;
}

// Characters that are the same in both forms, as nearly all names are. NUL isn't counted among them.
template <class Units>
bool IsPlainAscii(Units const& text) noexcept
{
    return std::all_of(
        text.begin(), text.end(), [](unsigned unit) { return unit - 1 < 0x7F; });
}

u16str FromLatin1(CKFp_Bytes bytes)
{
    return u16str(bytes.begin(), bytes.end());
}

}  // namespace

std::string CKFp_ToUtf8(u16str const& text)
{
    if (IsPlainAscii(text)) return std::string(text.begin(), text.end());
    std::size_t at = FindLoneSurrogate(text, 0);
    if (at == text.size()) return Q_UTF16ToMBString(text);
    std::string bytes;
    for (std::size_t from = 0;; at = FindLoneSurrogate(text, from)) {
        bytes += Q_UTF16ToMBString(text.substr(from, at - from));
        if (at == text.size()) return bytes;
        bytes += static_cast<char>(0xED);
        bytes += static_cast<char>(0x80 | ((text[at] >> 6) & 0x3F));
        bytes += static_cast<char>(0x80 | (text[at] & 0x3F));
        from = at + 1;
    }
}

u16str CKFp_FromUtf8(CKFp_Bytes bytes)
{
    if (IsPlainAscii(bytes)) return FromLatin1(bytes);
    u16str text;
    for (std::size_t from = 0;;) {
        std::size_t const at = FindSurrogateBytes(bytes, from);
        if (at > from)
            text += Q_MBToUTF16String(std::string(reinterpret_cast<char const*>(bytes.data()) + from, at - from));
        if (at == bytes.size()) return text;
        text += static_cast<unsigned short>(0xD000 | ((bytes[at + 1] & 0x3F) << 6) | (bytes[at + 2] & 0x3F));
        from = at + 3;
    }
}

u16str CKFp_CutText(u16str text, unsigned long maxLength)
{
    if (maxLength == 0 || text.size() <= maxLength) return text;
    bool const splits = IsHigh(text[maxLength - 1]) && IsLow(text[maxLength]);
    text.resize(splits ? maxLength - 1 : maxLength);
    return text;
}

char** CKF_NewHandleFromString(u16str const& text, bool marked)
{
    try {
        std::string const bytes = CKFp_ToUtf8(text);
        bool const ascii = std::all_of(text.begin(), text.end(), [](unsigned unit) { return unit < 0x80; });
        std::size_t const front = marked && !ascii ? sizeof Utf8Mark : 0;
        char** const handle = Q_AllocateHandleClear(CKFp_AllocationId, "text handle", front + bytes.size());
        if (!handle) return nullptr;
        std::memcpy(*handle, Utf8Mark, front);
        std::memcpy(*handle + front, bytes.data(), bytes.size());
        return handle;
    } catch (std::bad_alloc const&) {
        return nullptr;
    }
}

u16str CKF_ConvertHandleToStringAndDisposeIfEncoded(char*** handle, CKF_TextEncoding const* encoding)
{
    if (!handle || !*handle) return {};
    std::unique_ptr<char*, CKFp_FreePtr> const owner(std::exchange(*handle, nullptr));
    CKFp_Bytes const bytes(reinterpret_cast<unsigned char const*>(*owner), Q_GetHandleSize(owner.get()));
    if (bytes.size() >= sizeof Utf8Mark && std::equal(std::begin(Utf8Mark), std::end(Utf8Mark), bytes.begin()))
        return CKFp_FromUtf8(bytes.subspan(sizeof Utf8Mark));
    return encoding && *encoding == CKF_TextEncoding_Latin1 ? FromLatin1(bytes) : CKFp_FromUtf8(bytes);
}
