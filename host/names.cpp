#include "host/names.h"

#include <cstddef>
#include <filesystem>

namespace kfshost {

namespace {

// The number of bytes of the UTF-8 sequence that `text` begins with; 0 if it begins with none. Overlong forms,
// surrogates and numbers past the last code point count as none.
std::size_t SequenceLength(std::string_view text)
{
    auto const byte = [&](std::size_t index) {
        return index < text.size() ? static_cast<unsigned char>(text[index]) : 0U;
    };
    auto const follows = [&](std::size_t index, unsigned int low = 0x80, unsigned int high = 0xBF) {
        return byte(index) >= low && byte(index) <= high;
    };
    unsigned int const first = byte(0);
    if (first < 0x80) return 1;
    if (first >= 0xC2 && first <= 0xDF) return follows(1) ? 2 : 0;
    if (first >= 0xE0 && first <= 0xEF) {
        unsigned int const low = first == 0xE0 ? 0xA0 : 0x80;
        unsigned int const high = first == 0xED ? 0x9F : 0xBF;
        return follows(1, low, high) && follows(2) ? 3 : 0;
    }
    if (first >= 0xF0 && first <= 0xF4) {
        unsigned int const low = first == 0xF0 ? 0x90 : 0x80;
        unsigned int const high = first == 0xF4 ? 0x8F : 0xBF;
        return follows(1, low, high) && follows(2) && follows(3) ? 4 : 0;
    }
    return 0;
}

// C0, DEL and C1: what a terminal might act on.
bool IsControl(std::string_view sequence)
{
    auto const first = static_cast<unsigned char>(sequence[0]);
    return first < 0x20 || first == 0x7F || (first == 0xC2 && static_cast<unsigned char>(sequence[1]) < 0xA0);
}

// As a C program would write it.
void AppendEscaped(std::string& text, std::string_view bytes)
{
    constexpr std::string_view digits = "0123456789abcdef";
    for (char const c : bytes) {
        std::size_t const named = std::string_view("\n\t\r").find(c);
        text += '\\';
        if (named != std::string_view::npos) {
            text += "ntr"[named];
        } else {
            text += 'x';
            text += digits[static_cast<unsigned char>(c) >> 4];
            text += digits[static_cast<unsigned char>(c) & 15];
        }
    }
}

}  // namespace

std::string CleanName(std::string_view name)
{
    std::string clean;
    clean.reserve(name.size());
    while (!name.empty()) {
        std::size_t const length = SequenceLength(name);
        std::string_view const sequence = name.substr(0, length == 0 ? 1 : length);
        if (length == 0 || IsControl(sequence))
            AppendEscaped(clean, sequence);
        else
            clean += sequence;
        name.remove_prefix(sequence.size());
    }
    return clean;
}

std::string StemOf(std::string const& fileName)
{
    return fileName == "-" ? "stdin" : CleanName(std::filesystem::path(fileName).stem().string());
}

std::string UniqueNames::Make(std::string const& wanted)
{
    if (taken_.insert(wanted).second) return wanted;
    int& copy = copies_.try_emplace(wanted, 1).first->second;
    std::string name;
    do {
        name = wanted + '#' + std::to_string(++copy);
    } while (!taken_.insert(name).second);
    return name;
}

}  // namespace kfshost
