#include "frame/services/strings.h"

#include <algorithm>
#include <charconv>
#include <climits>
#include <cmath>

namespace hearth::string {

namespace {

std::string FixedText(double number, int precision)
{
    // The longest double has 309 digits before the point.
    std::string text(320 + static_cast<std::size_t>(precision), 0);
    auto const end = std::to_chars(text.data(), text.data() + text.size(), number, std::chars_format::fixed, precision);
    text.resize(static_cast<std::size_t>(end.ptr - text.data()));
    return text;
}

bool IsIn(unsigned short unit, std::string_view set) noexcept
{
    return unit < 0x80 && set.find(static_cast<char>(unit)) != std::string_view::npos;
}

}  // namespace

u16str NumberToString(double number, int width, int precision, int flags, int limit)
{
    std::string text = FixedText(number, std::max(precision, 0));
    std::size_t const wanted = static_cast<std::size_t>(std::max(std::min(width, limit), 0));
    if (text.size() < wanted) {
        bool const zeros = (flags & NumberFlag_ZeroPad) != 0 && std::isfinite(number);
        std::size_t const place = zeros && text.front() == '-' ? 1 : 0;
        text.insert(place, wanted - text.size(), zeros ? '0' : ' ');
    }
    return AsciiToUTF16(text.c_str());
}

bool StringToNumber(u16str const& text, int* number, int flags)
{
    const std::string_view skipped = (flags & NumberFlag_SkipAssignment) != 0 ? " \t\r\n=:(" : " \t\r\n";
    auto unit = std::find_if_not(text.begin(), text.end(), [&](unsigned short u) { return IsIn(u, skipped); });
    bool const negative = unit != text.end() && *unit == '-';
    if (unit != text.end() && IsIn(*unit, "+-")) ++unit;
    if (unit == text.end() || !IsIn(*unit, "0123456789")) return false;
    // Beyond the limits only the sign matters: the magnitude stays at the first value that is too great.
    constexpr long long tooGreat = static_cast<long long>(INT_MAX) + 2;
    long long magnitude = 0;
    for (; unit != text.end() && IsIn(*unit, "0123456789"); ++unit)
        magnitude = std::min(magnitude * 10 + (*unit - '0'), tooGreat);
    *number = static_cast<int>(std::clamp<long long>(negative ? -magnitude : magnitude, INT_MIN, INT_MAX));
    return true;
}

int ReplaceInString(u16str* text, u16str const& what, u16str const& with)
{
    if (what.empty()) return 0;
    u16str result;
    int count = 0;
    std::size_t done = 0;
    for (std::size_t found = text->find(what); found != u16str::npos; found = text->find(what, done), ++count) {
        result.append(*text, done, found - done);
        result += with;
        done = found + what.size();
    }
    if (count == 0) return 0;
    result.append(*text, done, u16str::npos);
    text->swap(result);
    return count;
}

}  // namespace hearth::string
