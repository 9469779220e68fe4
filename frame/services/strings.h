// Texts: UTF-16 inside, UTF-8 or plain bytes outside, and the tables of localised messages.
//
// `u16str` holds UTF-16 units. "Multibyte" means UTF-8. No conversion fails: each ill-formed sequence of the source (as
// the Unicode standard divides them, at its maximal subparts) becomes one U+FFFD. A null source is an empty text.
// Conversions throw std::bad_alloc when memory runs out.
//
// Threads: any.
#pragma once

#include "frame/services/export.h"
#include "frame/services/memory.h"

#include <array>
#include <atomic>
#include <span>
#include <string>
#include <string_view>

using u16str = std::basic_string<unsigned short, std::char_traits<unsigned short>,
                                 hearth::allocator::RecyclingAllocator<unsigned short>>;

// Names as they stand in files: bytes.
using Q_ByteString = std::basic_string<unsigned char>;

inline constexpr int Q_Err_BadDestination = 0x1701;  // a null destination, or one without room for a terminator

// ---- conversions

KFS_SERVICE_API u16str Q_MBToUTF16String(char const* text);
KFS_SERVICE_API u16str Q_MBToUTF16String(std::string const& text);
// The bool has no meaning.
KFS_SERVICE_API std::string Q_UTF16ToMBString(u16str const& text, bool reserved = false);

// Match names are UTF-8 too, held as unsigned bytes. A well-formed name survives the way there and back.
KFS_SERVICE_API u16str Q_MatchNameToUTF16String(unsigned char const* name);
KFS_SERVICE_API u16str Q_MatchNameToUTF16String(char const* name);
KFS_SERVICE_API Q_ByteString Q_UTF16To8String(u16str const& text);

// Bytes above 0x7F aren't ASCII and become U+FFFD each.
KFS_SERVICE_API u16str Q_AsciiToUTF16String(char const* text);

// Copies a text into `destination`, which has room for `size` bytes: as many bytes as fit before the terminator, which
// is always written. Cutting a text short is not an error; it may cut a multibyte character in two.
// Source and destination may overlap. Result: 0, or Q_Err_BadDestination.
[[nodiscard]] KFS_SERVICE_API int Q_CopyString(char const* source, long size, char* destination) noexcept;
[[nodiscard]] inline int Q_CopyString(unsigned char const* source, long size, char* destination) noexcept
{
    return Q_CopyString(reinterpret_cast<char const*>(source), size, destination);
}

// ---- message tables

// One message, "key=text". `cache` belongs to the lookup.
struct Q_ZRow {
    char const* entry;  // null in the closing row
    mutable std::atomic<char const*> cache{nullptr};
};

struct Q_ZTable {
    char const* module;
    int rowCount;  // with the closing row
    Q_ZRow const* rows;
};

// The text of a row: its translation if there is one, else what follows the first "=". Marks and placeholders in it
// stay as they are. The result is valid for ever. The closing row, and a row that the table doesn't have, give "". The
// two ints have no meaning; callers pass 0.
KFS_SERVICE_API char const* Q_ZLookupLStrCache(Q_ZTable const* const* table, int row, int reserved, int reserved2);

// The text of a single "$$$/key=text" in UTF-16, translated the same way. A text without "$$$" at its front is taken
// whole.
KFS_SERVICE_API u16str Q_ZStringToUTF16String(char const* text);

// Gives the UTF-8 translation for a key, or null to keep the built-in text. Set it before the first lookup: rows that
// were looked up keep their text. Null removes it. The result must stay valid during the call only. A translation is
// taken only if its printf conversions are those of the built-in text, each spelled the same and in the same order.
using Q_TranslateFunc = char const* (*)(std::string_view key);
KFS_SERVICE_API void Q_SetTranslateFunc(Q_TranslateFunc translate) noexcept;

// ---- placeholders

// One value for a placeholder: text or a whole number. Borrows the text.
class Q_SubArgument {
public:
    Q_SubArgument(char const* text) noexcept : text8_(text ? std::string_view(text) : std::string_view()) {}
    Q_SubArgument(unsigned char const* text) noexcept : Q_SubArgument(reinterpret_cast<char const*>(text)) {}
    Q_SubArgument(std::string const& text) noexcept : text8_(text) {}
    Q_SubArgument(u16str const& text) noexcept : text16_(&text) {}
    Q_SubArgument(short number) noexcept : number_(number), isNumber_(true) {}
    Q_SubArgument(int number) noexcept : number_(number), isNumber_(true) {}
    Q_SubArgument(unsigned int number) noexcept : number_(number), isNumber_(true) {}
    Q_SubArgument(long number) noexcept : number_(number), isNumber_(true) {}

    // The value as UTF-8.
    KFS_SERVICE_API std::string ToMultibyte() const;

private:
    std::string_view text8_;
    u16str const* text16_ = nullptr;
    long long number_ = 0;
    bool isNumber_ = false;
};

[[nodiscard]] KFS_SERVICE_API int Q_SubStringList(char* destination, long size, char const* format,
                                                  std::span<Q_SubArgument const> arguments);
KFS_SERVICE_API void Q_SubStringList(u16str* destination, u16str const& format,
                                     std::span<Q_SubArgument const> arguments);

// Fills the placeholders of `format`: "^^1" to "^^9" stand for the first to the ninth argument, and so do "^^L1" to
// "^^L9", where a number is expected. A placeholder without an argument stays as it is, and what was put in is not
// looked through again. The result is cut to `size` bytes with the terminator. Result: 0, or Q_Err_BadDestination.
template <class... Arguments>
[[nodiscard]] int Q_SubString(char* destination, long size, char const* format, Arguments const&... arguments)
{
    const std::array<Q_SubArgument, sizeof...(Arguments)> list{Q_SubArgument(arguments)...};
    return Q_SubStringList(destination, size, format, list);
}

// The same for UTF-16, where the short form "^1" to "^9" is a placeholder too. `format` may be `*destination`.
template <class... Arguments>
void Q_SubString(u16str* destination, u16str const& format, Arguments const&... arguments)
{
    const std::array<Q_SubArgument, sizeof...(Arguments)> list{Q_SubArgument(arguments)...};
    Q_SubStringList(destination, format, list);
}

namespace hearth::string {

// As Q_AsciiToUTF16String.
KFS_SERVICE_API u16str AsciiToUTF16(char const* text);

inline constexpr int NumberFlag_SkipAssignment = 1;  // StringToNumber: a number may be assigned, as in " = 24"
inline constexpr int NumberFlag_ZeroPad = 4;         // NumberToString: pad with zeros behind the sign, not with blanks

// A number as decimal text, the same in every locale.
//   width      pad on the left to this many units
//   precision  digits behind the point
//   flags      0 or NumberFlag_ZeroPad
//   limit      padding ends at this many units; a longer number is never cut
KFS_SERVICE_API u16str NumberToString(double number, int width, int precision, int flags, int limit);

// Reads a whole number at the front of a text, after blanks: a sign, then decimal digits, up to the first other unit.
// With NumberFlag_SkipAssignment blanks, "=", ":" and "(" may stand before it.
// Beyond the limits of int the nearest limit is the answer. Without a digit the answer is false and `number` untouched.
KFS_SERVICE_API bool StringToNumber(u16str const& text, int* number, int flags);

// Replaces every occurrence of `what`, from left to right, in one pass. Returns how many there were.
KFS_SERVICE_API int ReplaceInString(u16str* text, u16str const& what, u16str const& with);

}  // namespace hearth::string
