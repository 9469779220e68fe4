// UTF-8 and UTF-16 by hand. ICU has these two conversions too, but it would bring 36 MB and a version of its own to every
// host for them.
#include "frame/services/strings.h"

#include <cstring>

namespace {

constexpr char32_t Replacement = 0xFFFD;

struct Range {
    unsigned char low, high;
    bool Has(unsigned char byte) const noexcept { return byte >= low && byte <= high; }
};
constexpr Range Continuation{0x80, 0xBF};

// What a lead byte announces: how many bytes follow, which bits of the lead count, and the range of the second byte,
// which rules out overlong forms, surrogates and what lies beyond U+10FFFF.
struct Lead {
    int following;
    unsigned char bits;
    Range second;
};

constexpr Lead LeadOf(unsigned char byte) noexcept
{
    if (byte >= 0xC2 && byte <= 0xDF) return {1, 0x1F, Continuation};
    if (byte == 0xE0) return {2, 0x0F, {0xA0, 0xBF}};
    if (byte == 0xED) return {2, 0x0F, {0x80, 0x9F}};
    if (byte >= 0xE1 && byte <= 0xEF) return {2, 0x0F, Continuation};
    if (byte == 0xF0) return {3, 0x07, {0x90, 0xBF}};
    if (byte >= 0xF1 && byte <= 0xF3) return {3, 0x07, Continuation};
    if (byte == 0xF4) return {3, 0x07, {0x80, 0x8F}};
    return {0, 0, {}};  // a continuation, or a byte that UTF-8 doesn't have
}

// Takes one code point, or one ill-formed sequence up to the byte that breaks it, off the front of a text.
char32_t TakeUtf8(std::string_view& text) noexcept
{
    unsigned char const first = static_cast<unsigned char>(text.front());
    text.remove_prefix(1);
    if (first < 0x80) return first;
    Lead const lead = LeadOf(first);
    if (lead.following == 0) return Replacement;
    char32_t point = first & lead.bits;
    Range allowed = lead.second;
    for (int i = 0; i < lead.following; ++i) {
        if (text.empty() || !allowed.Has(static_cast<unsigned char>(text.front()))) return Replacement;
        point = (point << 6) | (static_cast<unsigned char>(text.front()) & 0x3Fu);
        text.remove_prefix(1);
        allowed = Continuation;
    }
    return point;
}

void AppendUtf16(u16str& text, char32_t point)
{
    if (point < 0x10000) {
        text.push_back(static_cast<unsigned short>(point));
        return;
    }
    point -= 0x10000;
    text.push_back(static_cast<unsigned short>(0xD800 + (point >> 10)));
    text.push_back(static_cast<unsigned short>(0xDC00 + (point & 0x3FF)));
}

bool IsHighSurrogate(char32_t unit) noexcept
{
    return unit >= 0xD800 && unit <= 0xDBFF;
}

bool IsLowSurrogate(char32_t unit) noexcept
{
    return unit >= 0xDC00 && unit <= 0xDFFF;
}

// Takes one code point, or one unpaired surrogate, at an index and moves the index past it.
char32_t TakeUtf16(u16str const& text, std::size_t& index) noexcept
{
    char32_t const unit = text[index++];
    if (!IsHighSurrogate(unit)) return IsLowSurrogate(unit) ? Replacement : unit;
    if (index == text.size() || !IsLowSurrogate(text[index])) return Replacement;
    return 0x10000 + ((unit - 0xD800) << 10) + (text[index++] - 0xDC00u);
}

template <class Bytes>
void AppendUtf8(Bytes& text, char32_t point)
{
    auto const put = [&](char32_t byte) { text.push_back(static_cast<typename Bytes::value_type>(byte)); };
    auto const putContinuation = [&](int shift) { put(0x80 | ((point >> shift) & 0x3F)); };
    if (point < 0x80) {
        put(point);
    } else if (point < 0x800) {
        put(0xC0 | (point >> 6));
        putContinuation(0);
    } else if (point < 0x10000) {
        put(0xE0 | (point >> 12));
        putContinuation(6);
        putContinuation(0);
    } else {
        put(0xF0 | (point >> 18));
        putContinuation(12);
        putContinuation(6);
        putContinuation(0);
    }
}

u16str FromUtf8(std::string_view text)
{
    u16str result;
    result.reserve(text.size());
    while (!text.empty()) AppendUtf16(result, TakeUtf8(text));
    return result;
}

template <class Bytes>
Bytes ToUtf8(u16str const& text)
{
    Bytes result;
    result.reserve(text.size());
    for (std::size_t i = 0; i < text.size();) AppendUtf8(result, TakeUtf16(text, i));
    return result;
}

std::string_view OrEmpty(char const* text) noexcept
{
    return text ? std::string_view(text) : std::string_view();
}

}  // namespace

u16str Q_MBToUTF16String(char const* text)
{
    return FromUtf8(OrEmpty(text));
}

u16str Q_MBToUTF16String(std::string const& text)
{
    return FromUtf8(text);
}

std::string Q_UTF16ToMBString(u16str const& text, bool)
{
    return ToUtf8<std::string>(text);
}

u16str Q_MatchNameToUTF16String(char const* name)
{
    return FromUtf8(OrEmpty(name));
}

u16str Q_MatchNameToUTF16String(unsigned char const* name)
{
    return Q_MatchNameToUTF16String(reinterpret_cast<char const*>(name));
}

Q_ByteString Q_UTF16To8String(u16str const& text)
{
    return ToUtf8<Q_ByteString>(text);
}

u16str Q_AsciiToUTF16String(char const* text)
{
    u16str result;
    for (char const character : OrEmpty(text)) {
        unsigned char const byte = static_cast<unsigned char>(character);
        AppendUtf16(result, byte < 0x80 ? byte : Replacement);
    }
    return result;
}

u16str hearth::string::AsciiToUTF16(char const* text)
{
    return Q_AsciiToUTF16String(text);
}

int Q_CopyString(char const* source, long size, char* destination) noexcept
{
    if (!destination || size <= 0) return Q_Err_BadDestination;
    std::size_t const length = source ? strnlen(source, static_cast<std::size_t>(size) - 1) : 0;
    if (length > 0) std::memmove(destination, source, length);
    destination[length] = 0;
    return 0;
}
