#include "frame/services/strings.h"

#include "tests/services/chunkbytes.h"

#include <climits>
#include <initializer_list>
#include <limits>
#include <random>
#include <string>
#include <tuple>
#include <vector>

namespace {

std::string Narrow(u16str const& text)
{
    return Q_UTF16ToMBString(text, false);
}

// ---- conversions

struct Utf8 {
    char const* why;
    std::string bytes;
    u16str units;
};

std::vector<Utf8> const WellFormed = {
    {"ascii", "a~\x7F", Units({'a', '~', 0x7F})},
    {"the first and last of two bytes", "\xC2\x80\xDF\xBF", Units({0x80, 0x7FF})},
    {"the first and last of three bytes", "\xE0\xA0\x80\xEF\xBF\xBF", Units({0x800, 0xFFFF})},
    {"around the surrogates", "\xED\x9F\xBF\xEE\x80\x80", Units({0xD7FF, 0xE000})},
    {"the first and last of four bytes", "\xF0\x90\x80\x80\xF4\x8F\xBF\xBF", Units({0xD800, 0xDC00, 0xDBFF, 0xDFFF})},
    {"a zero inside", std::string("a\0b", 3), Units({'a', 0, 'b'})},
    {"a replacement as such", "\xEF\xBF\xBD", Units({0xFFFD})},
    {"nothing", "", {}},
};

std::vector<Utf8> const IllFormed = {
    {"a continuation alone", "\x80", Units({0xFFFD})},
    {"each continuation counts", "\xBF\xBF", Units({0xFFFD, 0xFFFD})},
    {"bytes that UTF-8 hasn't", "\xC0\xC1\xF5\xFF", Units({0xFFFD, 0xFFFD, 0xFFFD, 0xFFFD})},
    {"an overlong slash", "\xC0\xAF", Units({0xFFFD, 0xFFFD})},
    {"an overlong form of three bytes", "\xE0\x9F\xBF", Units({0xFFFD, 0xFFFD, 0xFFFD})},
    {"an overlong form of four bytes", "\xF0\x8F\xBF\xBF", Units({0xFFFD, 0xFFFD, 0xFFFD, 0xFFFD})},
    {"a surrogate", "\xED\xA0\x80", Units({0xFFFD, 0xFFFD, 0xFFFD})},
    {"above the last code point", "\xF4\x90\x80\x80", Units({0xFFFD, 0xFFFD, 0xFFFD, 0xFFFD})},
    {"three of four bytes at the end are one", "\xF0\x9F\x98", Units({0xFFFD})},
    {"a break in the middle gives the breaker back", "\xE2\x82z", Units({0xFFFD, 'z'})},
    {"a lead broken by a lead", "\xE2\xC3\xA4", Units({0xFFFD, 0xE4})},
};

TEST(Strings, Utf8AndUtf16AreTheSameText)
{
    for (Utf8 const& row : WellFormed) {
        EXPECT_EQ(row.units, Q_MBToUTF16String(row.bytes)) << row.why;
        EXPECT_EQ(row.bytes, Narrow(row.units)) << row.why;
        Q_ByteString const bytes = Q_UTF16To8String(row.units);
        EXPECT_EQ(row.bytes, std::string(bytes.begin(), bytes.end())) << row.why;
        if (row.bytes.find('\0') == std::string::npos) {
            EXPECT_EQ(row.units, Q_MBToUTF16String(row.bytes.c_str())) << row.why;
            EXPECT_EQ(row.units, Q_MatchNameToUTF16String(bytes.c_str())) << row.why;
        }
    }
    EXPECT_TRUE(Q_MBToUTF16String(static_cast<char const*>(nullptr)).empty());
    EXPECT_TRUE(Q_MatchNameToUTF16String(static_cast<unsigned char const*>(nullptr)).empty());
}

TEST(Strings, IllFormedTextBecomesReplacements)
{
    for (Utf8 const& row : IllFormed) EXPECT_EQ(row.units, Q_MBToUTF16String(row.bytes)) << row.why;
    const std::string replacement = "\xEF\xBF\xBD";
    EXPECT_EQ(replacement, Narrow(Units({0xD800})));
    EXPECT_EQ(replacement, Narrow(Units({0xDC00})));
    EXPECT_EQ(replacement + "a", Narrow(Units({0xD800, 'a'})));
    EXPECT_EQ(replacement + replacement, Narrow(Units({0xDC00, 0xD800})));
    EXPECT_EQ(replacement + "\xF0\x90\x80\x80", Narrow(Units({0xD800, 0xD800, 0xDC00})));
    EXPECT_EQ(Units({'a', 0xFFFD, 'b'}), Q_AsciiToUTF16String("a\xE4"
                                                              "b"));
}

TEST(Strings, EveryCodePointSurvivesAndAnyBytesConverge)
{
    for (char32_t point = 1; point < 0x110000; point += point < 0x11000 ? 1 : 97) {
        if (point >= 0xD800 && point <= 0xDFFF) continue;
        int const units = static_cast<int>(point), high = 0xD800 + ((units - 0x10000) >> 10);
        u16str const text = units < 0x10000 ? Units({units}) : Units({high, 0xDC00 + (units & 0x3FF)});
        ASSERT_EQ(text, Q_MBToUTF16String(Narrow(text))) << std::hex << static_cast<unsigned>(point);
    }
    std::mt19937 random(3);
    for (int i = 0; i < 20000; ++i) {
        std::string bytes(random() % 12, 0);
        for (char& byte : bytes) byte = static_cast<char>(random() % 3 ? 0x80 + random() % 0x80 : random());
        u16str const once = Q_MBToUTF16String(bytes);
        ASSERT_EQ(once, Q_MBToUTF16String(Narrow(once))) << "what a conversion made is well-formed";
    }
}

TEST(Strings, CopyCutsAndTerminates)
{
    for (long size = 1; size <= 8; ++size) {
        std::string buffer(10, '#');
        EXPECT_EQ(0, Q_CopyString("abcde", size, buffer.data()));
        const std::string wanted = std::string("abcde").substr(0, static_cast<std::size_t>(size) - 1);
        EXPECT_STREQ(wanted.c_str(), buffer.c_str());
        EXPECT_EQ(std::string(10 - wanted.size() - 1, '#'), buffer.substr(wanted.size() + 1))
            << "nothing behind the end";
    }
    char buffer[4] = "###";
    EXPECT_EQ(Q_Err_BadDestination, Q_CopyString("abc", 0, buffer));
    EXPECT_EQ(Q_Err_BadDestination, Q_CopyString("abc", -5, buffer));
    EXPECT_STREQ("###", buffer);
    EXPECT_EQ(Q_Err_BadDestination, Q_CopyString("abc", 4, nullptr));
    EXPECT_EQ(0, Q_CopyString(static_cast<char const*>(nullptr), 4, buffer));
    EXPECT_STREQ("", buffer);
    char const unterminated[3] = {'a', 'b', 'c'};  // the sanitizer sees a read too far
    EXPECT_EQ(0, Q_CopyString(unterminated, 4, buffer));
    EXPECT_STREQ("abc", buffer);
}

// ---- messages

Q_ZRow const Rows[] = {
    {"$$$/Tests/0000=attempt to %s a #{ldquo}^^1#{rdquo}."},
    {"$$$/Tests/0001=a=b"},
    {"no key at all"},
    {"$$$/Tests/0003="},
    {"$$$/Tests/0004=translated below"},
    {nullptr},
};
Q_ZTable table{"TESTS", 6, Rows};
Q_ZTable* tableHandle = &table;

char const* Translate(std::string_view key)
{
    static std::string text;
    text = "\xC3\xBC"
           "bersetzt: " +
           std::string(key);  // overwritten by the next call
    return key == "$$$/Tests/0004" || key == "$$$/Tests/Single" ? text.c_str() : nullptr;
}

TEST(Messages, TheTextFollowsTheFirstEqualsSign)
{
    EXPECT_STREQ("attempt to %s a #{ldquo}^^1#{rdquo}.", Q_ZLookupLStrCache(&tableHandle, 0, 0, 0));
    EXPECT_STREQ("a=b", Q_ZLookupLStrCache(&tableHandle, 1, 0, 0));
    EXPECT_STREQ("no key at all", Q_ZLookupLStrCache(&tableHandle, 2, 0, 0));
    EXPECT_STREQ("", Q_ZLookupLStrCache(&tableHandle, 3, 0, 0));
    for (int const row : {5, 6, -1, INT_MIN, INT_MAX}) EXPECT_STREQ("", Q_ZLookupLStrCache(&tableHandle, row, 0, 0));
    EXPECT_EQ(Q_ZLookupLStrCache(&tableHandle, 0, 0, 0), Q_ZLookupLStrCache(&tableHandle, 0, 0, 0));

    EXPECT_EQ(Text("Some, text = more"), Q_ZStringToUTF16String("$$$/Tests/Key=Some, text = more"));
    EXPECT_EQ(Text("x = y"), Q_ZStringToUTF16String("x = y")) << "no key, so all of it is text";
    EXPECT_TRUE(Q_ZStringToUTF16String(nullptr).empty());
}

TEST(Messages, ATranslationTakesThePlaceOfTheTextForEver)
{
    Q_SetTranslateFunc(Translate);
    char const* const kept = Q_ZLookupLStrCache(&tableHandle, 4, 0, 0);
    EXPECT_EQ(Text("text"), Q_ZStringToUTF16String("$$$/Tests/Untranslated=text"));
    u16str wanted = Text("bersetzt: $$$/Tests/Single");
    wanted.insert(wanted.begin(), 0xFC);
    EXPECT_EQ(wanted, Q_ZStringToUTF16String("$$$/Tests/Single=single"));
    // What reads another argument than the caller passes is no translation of a format.
    for (auto const& [text, translation, fits] : {std::tuple("%s", "%s%n", false),
                                                  {"%s", "%n", false},
                                                  {"%s", "%d", false},
                                                  {"%s", "", false},
                                                  {"%s", "%-5s", false},
                                                  {"%s", "%2$s", false},
                                                  {"", "%s", false},
                                                  {"a %% of %s %d", "%d %s", false},
                                                  {"a %% of %s %d", "%s 100 %%, %d", true},
                                                  {"percent", "%", true},
                                                  {"percent", "%  d", false},
                                                  {"%5.2lf", "x%5.2lfx", true}}) {
        static char const* given;
        given = translation;
        Q_SetTranslateFunc([](std::string_view) { return given; });
        std::string const entry = std::string("$$$/k=") + text;
        EXPECT_EQ(Text(fits ? translation : text), Q_ZStringToUTF16String(entry.c_str()))
            << entry << ' ' << translation;
    }
    Q_SetTranslateFunc(nullptr);
    EXPECT_STREQ("\xC3\xBC"
                 "bersetzt: $$$/Tests/0004",
                 kept)
        << "the translator's buffer was used again since";
    EXPECT_EQ(kept, Q_ZLookupLStrCache(&tableHandle, 4, 0, 0));
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
}

TEST(SubString, Utf16TakesTheShortFormToo)
{
    u16str text = Text("reading the ^1 parameter ^^1, ^^L2, ^3 and ^0");
    u16str const name = Units({0xD83D, 0xDE00, 0xE4});
    Q_SubString(&text, text, name, -7L);
    u16str wanted = Text("reading the ") + name + Text(" parameter ") + name + Text(", -7, ^3 and ^0");
    EXPECT_EQ(wanted, text);
}

// ---- numbers

TEST(Numbers, AreWrittenAlikeEverywhere)
{
    using hearth::string::NumberToString;
    const struct {
        double number;
        int width, precision, flags, limit;
        char const* text;
    } table16[] = {
        {7, 3, 0, 4, 31, "007"},
        {-7, 4, 0, 4, 31, "-007"},
        {7, 3, 0, 0, 31, "  7"},
        {1234, 2, 0, 4, 31, "1234"},
        {0, 1, 0, 4, 31, "0"},
        {7, 50, 0, 4, 5, "00007"},
        {123456, 50, 0, 4, 3, "123456"},
        {2.5, 0, 2, 0, 31, "2.50"},
        {4294967295.0, 0, 0, 4, 31, "4294967295"},
        {std::numeric_limits<double>::infinity(), 5, 0, 4, 31, "  inf"},
    };
    for (auto const& row : table16)
        EXPECT_EQ(row.text, Narrow(NumberToString(row.number, row.width, row.precision, row.flags, row.limit)));
    EXPECT_EQ(309u, NumberToString(std::numeric_limits<double>::max(), 0, 0, 0, 31).size());
}

TEST(Numbers, AreReadUpToWhatIsNone)
{
    constexpr int None = 77777;
    const struct {
        char const* text;
        int plain, assigned;  // None: no number
    } table16[] = {
        {"24", 24, 24},
        {"  -24;", -24, -24},
        {" = 24; // a second", None, 24},
        {"=-3", None, -3},
        {": 12}", None, 12},
        {"(8)", None, 8},
        {"+5.9", 5, 5},
        {"0012", 12, 12},
        {"2147483647", INT_MAX, INT_MAX},
        {"2147483648", INT_MAX, INT_MAX},
        {"-2147483648", INT_MIN, INT_MIN},
        {"-99999999999999999999", INT_MIN, INT_MIN},
        {"99999999999999999999", INT_MAX, INT_MAX},
        {"", None, None},
        {"-", None, None},
        {"- 5", None, None},
        {"= x5", None, None},
    };
    for (auto const& row : table16)
        for (int const flags : {0, hearth::string::NumberFlag_SkipAssignment}) {
            SCOPED_TRACE(testing::Message() << "\"" << row.text << "\", flags " << flags);
            int const wanted = flags ? row.assigned : row.plain;
            int number = None;
            EXPECT_EQ(wanted != None, hearth::string::StringToNumber(Text(row.text), &number, flags));
            EXPECT_EQ(wanted, number);
        }
    int number = None;
    EXPECT_FALSE(hearth::string::StringToNumber(Units({0x0665}), &number, 0)) << "digits of other scripts aren't read";
}

TEST(ReplaceInString, ReplacesEachOccurrenceOfTheSource)
{
    const struct {
        char const *text, *what, *with, *result;
        int count;
    } table16[] = {
        {"@0_@1", "@0", "Position", "Position_@1", 1},
        {"aaaa", "aa", "aaa", "aaaaaa", 2},
        {"abcabc", "c", "", "abab", 2},
        {"abc", "", "x", "abc", 0},
        {"abc", "abcd", "x", "abc", 0},
        {"@0@0", "@0", "@0", "@0@0", 2},
    };
    for (auto const& row : table16) {
        u16str text = Text(row.text);
        EXPECT_EQ(row.count, hearth::string::ReplaceInString(&text, Text(row.what), Text(row.with)));
        EXPECT_EQ(row.result, Narrow(text));
    }
}

}  // namespace
