// Texts: conversions against plain twins of them, messages, placeholders and numbers.
#include "frame/services/strings.h"

#include "tests/services/chunkbytes.h"
#include "tests/support/dice.h"

#include <climits>
#include <cmath>
#include <cstdio>
#include <limits>
#include <regex>
#include <string>
#include <tuple>

namespace {

std::string Narrow(u16str const& text)
{
    return Q_UTF16ToMBString(text, false);
}

// ---- conversions

u16str UnitsOf(int point)
{
    return point < 0x10000 ? Units({point}) : Units({0xD7C0 + point / 0x400, 0xDC00 + point % 0x400});
}

// The code point whose UTF-8 these one to four bytes are, or -1.
int PointOf(std::string const& bytes)
{
    int point = bytes[0] & (bytes.size() == 1 ? 0x7F : 0x7F >> bytes.size());
    for (std::size_t i = 1; i < bytes.size(); ++i) point = point << 6 | (bytes[i] & 0x3F);
    return point <= 0x10FFFF && PlainUtf8(UnitsOf(point), 0xFFFD) == bytes ? point : -1;
}

// Any bytes as a text: what is no code point and begins none is a replacement each byte, the beginning of one is one.
u16str PlainUtf16(std::string const& bytes)
{
    u16str text;
    std::size_t taken = 1;
    for (std::size_t at = 0; at < bytes.size(); at += taken) {
        int point = -1;
        taken = 1;
        for (std::size_t size = 1; size <= 4 && at + size <= bytes.size() && point < 0; ++size) {
            std::string const part = bytes.substr(at, size);
            point = PointOf(part);
            bool isTaken = point >= 0;
            for (std::size_t rest = 1; rest <= 4 - size; ++rest)
                for (char const fill : {'\x80', '\xBF'}) isTaken |= PointOf(part + std::string(rest, fill)) >= 0;
            if (isTaken) taken = size;
        }
        text += UnitsOf(point < 0 ? 0xFFFD : point);
    }
    return text;
}

TEST(Strings, ConversionsAgreeWithPlainOnes)
{
    EXPECT_EQ("a\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80", Narrow(Units({'a', 0xE4, 0x20AC, 0xD83D, 0xDE00})));
    EXPECT_EQ(Units({'a', 0xE4, 0x20AC, 0xD83D, 0xDE00, 0xFFFD, 'z', 0xFFFD, 0xFFFD}),
              Q_MBToUTF16String("a\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80\xF0\x9F\x98z\xC0\xAF"));
    for (int point = 0; point < 0x110000; point += point < 0x11000 ? 1 : 97) {
        u16str const text = UnitsOf(point);
        ASSERT_EQ(PlainUtf8(text, 0xFFFD), Narrow(text)) << point;
        ASSERT_EQ(point / 0x800 == 0x1B ? Units({0xFFFD}) : text, Q_MBToUTF16String(Narrow(text))) << point;
    }
    constexpr int bytes[] = {0,    'a',  0x7F, 0x80, 0x8F, 0x90, 0x9F, 0xA0, 0xBF, 0xC0, 0xC1, 0xC2, 0xDF,
                             0xE0, 0xE1, 0xEC, 0xED, 0xEE, 0xEF, 0xF0, 0xF1, 0xF3, 0xF4, 0xF5, 0xFF};
    constexpr int units[] = {0, 'a', 0x7F, 0x80, 0x7FF, 0x800, 0xD7FF, 0xD800, 0xDBFF, 0xDC00, 0xDFFF, 0xE000, 0xFFFF};
    Dice dice(3);
    for (int i = 0; i < Rounds(4000); ++i) {
        std::string multibyte;
        u16str text;
        for (int k = dice.Below(9); k > 0; --k) multibyte += static_cast<char>(bytes[dice.Below(std::size(bytes))]);
        for (int k = dice.Below(9); k > 0; --k) text += Units({units[dice.Below(std::size(units))]});
        u16str const fromBytes = Q_MBToUTF16String(multibyte);
        ASSERT_EQ(PlainUtf16(multibyte), fromBytes) << testing::PrintToString(multibyte);
        ASSERT_EQ(PlainUtf8(text, 0xFFFD), Narrow(text));
        Q_ByteString const name = Q_UTF16To8String(text);
        EXPECT_EQ(Narrow(text), std::string(name.begin(), name.end()));
        EXPECT_EQ(PlainUtf16(multibyte.c_str()), Q_MBToUTF16String(multibyte.c_str())) << "up to the first zero";
        EXPECT_EQ(PlainUtf16(Narrow(text).c_str()), Q_MatchNameToUTF16String(name.c_str()));
    }
    for (int byte = 1; byte < 256; ++byte) {
        char const letters[] = {'a', static_cast<char>(byte), 0};
        EXPECT_EQ(Units({'a', byte < 0x80 ? byte : 0xFFFD}), Q_AsciiToUTF16String(letters));
    }
    EXPECT_TRUE(Q_MBToUTF16String(static_cast<char const*>(nullptr)).empty());
    EXPECT_TRUE(Q_MatchNameToUTF16String(static_cast<unsigned char const*>(nullptr)).empty());
}

TEST(Strings, CopyCutsAndTerminates)
{
    for (long size = -1; size <= 8; ++size) {
        std::string buffer(10, '#');
        std::string const wanted =
            std::string("abcde").substr(0, static_cast<std::size_t>(std::max(size, 1L)) - 1) + '\0';
        EXPECT_EQ(size > 0 ? 0 : Q_Err_BadDestination, Q_CopyString("abcde", size, buffer.data()));
        EXPECT_EQ(size > 0 ? wanted + buffer.substr(wanted.size()) : std::string(10, '#'), buffer);
        EXPECT_EQ(std::string(10 - wanted.size(), '#'), buffer.substr(wanted.size())) << "nothing behind the end";
    }
    char buffer[4] = "###";
    EXPECT_EQ(Q_Err_BadDestination, Q_CopyString("abc", 4, nullptr));
    EXPECT_EQ(0, Q_CopyString(static_cast<char const*>(nullptr), 4, buffer));
    EXPECT_STREQ("", buffer);
    char const unterminated[3] = {'a', 'b', 'c'};  // the sanitizer sees a read too far
    EXPECT_EQ(0, Q_CopyString(unterminated, 4, buffer));
    EXPECT_STREQ("abc", buffer);
}

// ---- messages

Q_ZRow const Rows[] = {{"$$$/Tests/0000=attempt to %s a #{ldquo}^^1#{rdquo}."},
                       {"$$$/Tests/0001=a=b"},
                       {"no key at all"},
                       {"$$$/Tests/0003="},
                       {"$$$/Tests/0004=%s"},
                       {nullptr}};
Q_ZTable table{"TESTS", 6, Rows};
Q_ZTable* tableHandle = &table;

char const* Look(int row)
{
    return Q_ZLookupLStrCache(&tableHandle, row, 0, 0);
}

TEST(Messages, TheTextFollowsTheFirstEqualsSign)
{
    char const* const texts[] = {"attempt to %s a #{ldquo}^^1#{rdquo}.", "a=b", "no key at all", ""};
    for (int row = 0; row < 4; ++row) EXPECT_STREQ(texts[row], Look(row));
    for (int const row : {5, 6, -1, INT_MIN, INT_MAX}) EXPECT_STREQ("", Look(row));
    EXPECT_EQ(Look(0), Look(0));
    EXPECT_EQ(Text("Some, text = more"), Q_ZStringToUTF16String("$$$/Tests/Key=Some, text = more"));
    EXPECT_EQ(Text("x = y"), Q_ZStringToUTF16String("x = y")) << "no key, so all of it is text";
    EXPECT_TRUE(Q_ZStringToUTF16String(nullptr).empty());
}

TEST(Messages, ATranslationTakesThePlaceOfTheTextForEver)
{
    static std::string given, key;
    Q_SetTranslateFunc([](std::string_view asked) {
        key = asked;
        return given.empty() ? nullptr : given.c_str();
    });
    given = "\xC3\xBC %s";
    char const* const kept = Look(4);
    EXPECT_EQ("$$$/Tests/0004", key);
    // What reads another argument than the caller passes is no translation of a format.
    using Row = std::tuple<char const*, char const*, bool>;
    Row const rows[] = {{"text", "", false},
                        {"", "\xC3\xBC", true},
                        {"%s", "%s%n", false},
                        {"%s", "%n", false},
                        {"%s", "%d", false},
                        {"%s", "none", false},
                        {"%s", "%-5s", false},
                        {"%s", "%2$s", false},
                        {"", "%s", false},
                        {"%% %s %d", "%d %s", false},
                        {"%% %s %d", "%s %%, %d", true},
                        {"percent", "%", true},
                        {"percent", "%  d", false},
                        {"%5.2lf", "x%5.2lfx", true}};
    for (auto const& [text, translation, fits] : rows) {
        given = translation;
        std::string const entry = std::string("$$$/k=") + text;
        EXPECT_EQ(Q_MBToUTF16String(fits ? translation : text), Q_ZStringToUTF16String(entry.c_str()))
            << entry << ' ' << translation;
    }
    Q_SetTranslateFunc(nullptr);
    EXPECT_STREQ("\xC3\xBC %s", kept) << "the translator's buffer was used again since";
    EXPECT_EQ(kept, Look(4));
    EXPECT_EQ(Text("single"), Q_ZStringToUTF16String("$$$/Tests/Single=single"));
}

// ---- placeholders

TEST(SubString, FillsPlaceholdersOnce)
{
    char text[80];
    EXPECT_EQ(0, Q_SubString(text, sizeof text,
                             "property of type #{ldquo}^^1#{rdquo}had dimension ^^L2 in file, but we expected ^^L3",
                             "KFS ^^2", 3, short{-1}));
    EXPECT_STREQ("property of type #{ldquo}KFS ^^2#{rdquo}had dimension 3 in file, but we expecte", text);
    EXPECT_EQ(0, Q_SubString(text, sizeof text, "^^2^^1^^2 ^1 ^^ ^^0 ^^3 ^^L ^^^1^", "a", std::string("b")));
    EXPECT_STREQ("bab ^1 ^^ ^^0 ^^3 ^^L ^a^", text);
    EXPECT_EQ(0, Q_SubString(text, 4, "^^1", Units({0xE4, 0xE4, 0xE4})));
    EXPECT_STREQ("\xC3\xA4\xC3", text);
    EXPECT_EQ(0, Q_SubString(text, sizeof text, "^^1|", static_cast<char const*>(nullptr)));
    EXPECT_STREQ("|", text);
    EXPECT_EQ(Q_Err_BadDestination, Q_SubString(text, 0, "x"));
    EXPECT_EQ(Q_Err_BadDestination, Q_SubString(nullptr, 5, "x"));

    u16str wide = Text("reading the ^1 parameter ^^1, ^^L2, ^3 and ^0");  // where the short form counts too
    u16str const name = Units({0xD83D, 0xDE00, 0xE4});
    Q_SubString(&wide, wide, name, -7L);
    EXPECT_EQ(Text("reading the ") + name + Text(" parameter ") + name + Text(", -7, ^3 and ^0"), wide);
}

// ---- numbers

TEST(Numbers, AreWrittenAlikeEverywhereAndReadUpToWhatIsNone)
{
    Dice dice(5);
    constexpr double odd[] = {0, 7, -7, 2.5, 4294967295.0, -123456.0, HUGE_VAL, std::numeric_limits<double>::max()};
    for (int i = 0; i < Rounds(3000); ++i) {
        double const number = dice.Below(2) ? odd[dice.Below(8)] : dice.Wild(20);
        int const width = dice.Below(60), precision = dice.Below(4), limit = dice.Below(40), pads = dice.Below(2);
        char wanted[400];
        std::snprintf(wanted, sizeof wanted, pads ? "%0*.*f" : "%*.*f", std::min(width, limit), precision, number);
        EXPECT_EQ(wanted, Narrow(hearth::string::NumberToString(number, width, precision, 4 * pads, limit)));
    }
    char const* const parts[] = {" ", "=", ":", "(", "-", "+", "x", "0", "9", "12", ".5", "21474836", "47", "48"};
    std::regex const plain(" *([-+]?)([0-9]+).*"), assigned("[ =:(]*([-+]?)([0-9]+).*");
    for (int i = 0; i < Rounds(3000); ++i) {
        std::string text = dice.Below(2) ? "=2147483" : "";
        for (int k = dice.Below(7); k > 0; --k) text += parts[dice.Below(14)];
        for (int const flags : {0, hearth::string::NumberFlag_SkipAssignment}) {
            std::smatch found;
            bool const isNumber = std::regex_match(text, found, flags ? assigned : plain);
            int number = 77777;
            EXPECT_EQ(isNumber, hearth::string::StringToNumber(Text(text.c_str()), &number, flags)) << text;
            double const exact = isNumber ? std::stod(found[1].str() + found[2].str()) : 77777;
            EXPECT_EQ(std::clamp<double>(exact, INT_MIN, INT_MAX), number) << text;
        }
    }
    int number = 5;
    EXPECT_FALSE(hearth::string::StringToNumber(Units({0x0665}), &number, 0)) << "digits of other scripts aren't read";
    using Row = std::tuple<char const*, char const*, char const*, char const*, int>;
    Row const rows[] = {{"@0_@1", "@0", "Position", "Position_@1", 1},
                        {"aaaa", "aa", "aaa", "aaaaaa", 2},
                        {"abcabc", "c", "", "abab", 2},
                        {"abc", "", "x", "abc", 0},
                        {"abc", "abcd", "x", "abc", 0},
                        {"@0@0", "@0", "@0", "@0@0", 2}};
    for (auto const& [from, what, with, wanted, count] : rows) {
        u16str text = Text(from);
        EXPECT_EQ(count, hearth::string::ReplaceInString(&text, Text(what), Text(with)));
        EXPECT_EQ(wanted, Narrow(text));
    }
}

}  // namespace
