#include "frame/services/strings.h"

#include <cstddef>

namespace {

// Where a placeholder ends and which argument it names; argument -1 where there is none.
struct Placeholder {
    std::size_t end;
    int argument;
};

template <class Text>
Placeholder ReadDigit(Text const& format, std::size_t at) noexcept
{
    if (at < format.size() && format[at] >= '1' && format[at] <= '9') return {at + 1, format[at] - '1'};
    return {0, -1};
}

template <class Text>
bool Has(Text const& format, std::size_t at, char character) noexcept
{
    return at < format.size() && format[at] == character;
}

template <class Text>
Placeholder ReadPlaceholder(Text const& format, std::size_t at, bool shortForm) noexcept
{
    if (!Has(format, at, '^')) return {0, -1};
    if (Has(format, at + 1, '^')) {
        std::size_t const digit = Has(format, at + 2, 'L') ? at + 3 : at + 2;
        return ReadDigit(format, digit);
    }
    return shortForm ? ReadDigit(format, at + 1) : Placeholder{0, -1};
}

// `appendArgument(result, argument)` appends a value in the form of the text.
template <class Result, class Text, class Append>
Result Fill(Text const& format, std::span<Q_SubArgument const> arguments, bool shortForm, Append appendArgument)
{
    Result result;
    for (std::size_t i = 0; i < format.size();) {
        Placeholder const placeholder = ReadPlaceholder(format, i, shortForm);
        if (placeholder.argument >= 0 && static_cast<std::size_t>(placeholder.argument) < arguments.size()) {
            appendArgument(result, arguments[static_cast<std::size_t>(placeholder.argument)]);
            i = placeholder.end;
        } else {
            result.push_back(format[i++]);
        }
    }
    return result;
}

}  // namespace

std::string Q_SubArgument::ToMultibyte() const
{
    if (isNumber_) return std::to_string(number_);
    return text16_ ? Q_UTF16ToMBString(*text16_) : std::string(text8_);
}

int Q_SubStringList(char* destination, long size, char const* format, std::span<Q_SubArgument const> arguments)
{
    if (!destination || size <= 0) return Q_Err_BadDestination;
    auto const append = [](std::string& result, Q_SubArgument const& argument) { result += argument.ToMultibyte(); };
    const std::string filled = Fill<std::string>(std::string_view(format ? format : ""), arguments, false, append);
    return Q_CopyString(filled.c_str(), size, destination);
}

void Q_SubStringList(u16str* destination, u16str const& format, std::span<Q_SubArgument const> arguments)
{
    auto const append = [](u16str& result, Q_SubArgument const& argument) {
        result += Q_MBToUTF16String(argument.ToMultibyte());
    };
    *destination = Fill<u16str>(format, arguments, true, append);
}
