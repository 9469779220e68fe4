#include "frame/services/context.h"
#include "frame/services/strings.h"

namespace {

std::atomic<Q_TranslateFunc> translateFunc{nullptr};

// A translation as a text that is valid for ever, or null.
char const* Translation(std::string_view key)
{
    Q_TranslateFunc const translate = translateFunc.load(std::memory_order_acquire);
    char const* const text = translate ? translate(key) : nullptr;
    return text ? hearth::utility::ImmutableString::Create(text).c_str() : nullptr;
}

// The next conversion of a printf format behind `position`, which then stands behind it; empty at the end. "%%", and a
// "%" that begins none, is text.
std::string_view NextConversion(std::string_view format, std::size_t* position)
{
    for (std::size_t at = *position; (at = format.find('%', at)) != format.npos;) {
        std::size_t const letter = format.find_first_not_of("0123456789$*.-+ #'hlLjztqI", at + 1);
        if (letter == format.npos) break;
        bool const isConversion = std::string_view("diouxXeEfFgGaAcsCSpnm").find(format[letter]) != format.npos;
        std::string_view const found = format.substr(at, letter + 1 - at);
        at = *position = letter + (isConversion || found == "%%");
        if (isConversion) return found;
    }
    *position = format.size();
    return {};
}

// Texts of a table are used as formats, so a translation that has other conversions would read what nobody passed.
bool HasSameConversions(std::string_view translation, std::string_view text)
{
    std::size_t inTranslation = 0, inText = 0;
    std::string_view conversion;
    do {
        conversion = NextConversion(translation, &inTranslation);
        if (conversion != NextConversion(text, &inText)) return false;
    } while (!conversion.empty());
    return true;
}

// What "key=text" says: the translation for the key, else the text. Without a "=" all of it is text.
char const* TextOfEntry(char const* entry)
{
    std::string_view const whole(entry);
    std::size_t const equals = whole.find('=');
    if (equals == std::string_view::npos) return entry;
    char const* const text = entry + equals + 1;
    char const* const translation = Translation(whole.substr(0, equals));
    return translation && HasSameConversions(translation, text) ? translation : text;
}

}  // namespace

void Q_SetTranslateFunc(Q_TranslateFunc translate) noexcept
{
    translateFunc.store(translate, std::memory_order_release);
}

char const* Q_ZLookupLStrCache(Q_ZTable const* const* table, int row, int, int)
{
    Q_ZTable const& messages = **table;
    if (row < 0 || row >= messages.rowCount || !messages.rows[row].entry) return "";
    Q_ZRow const& message = messages.rows[row];
    char const* text = message.cache.load(std::memory_order_acquire);
    if (!text) {
        text = TextOfEntry(message.entry);
        message.cache.store(text, std::memory_order_release);
    }
    return text;
}

u16str Q_ZStringToUTF16String(char const* text)
{
    bool const hasKey = text && std::string_view(text).starts_with("$$$");
    return Q_MBToUTF16String(hasKey ? TextOfEntry(text) : text);
}
