// What is written, byte for byte, and that it is read back.
#include "tests/services/chunkbytes.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <functional>
#include <tuple>
#include <vector>

namespace {

struct Golden {
    char const* why;
    std::function<void(CKF_File*)> write;
    std::string bytes;
};

void WriteNested(CKF_File* file)
{
    const CKF_ScWriteList outer(file, CKF_Id("kfgp"), 0);
    CKF_ChunkInfo leaf{};
    EXPECT_EQ(0, CKF_BeginChunkWrite(file, CKF_ListId, 1234, CKF_Id("kfbs"), &leaf));
    EXPECT_EQ(CKF_ListId, leaf.id);
    EXPECT_EQ(0, CKF_WriteAtom(file, CKF_Id("kfsb"), 4, "\1\2\3\4"));
    EXPECT_EQ(0, CKF_EndChunkWrite(file, &leaf));
    EXPECT_EQ(12u, leaf.size);
    EXPECT_EQ(0, CKF_WriteAtom(file, CKF_Id("kfix"), 4, "last"));
}

void WriteHandle(CKF_File* file)
{
    char** const handle = Q_AllocateHandleClear(0, "test", 5);
    std::copy_n("time*", 5, *handle);
    EXPECT_EQ(0, CKF_WriteHandle(file, CKF_Id("expr"), handle));
    Q_FreeHandle(handle);
}

u16str Units(std::initializer_list<int> units)
{
    return u16str(units.begin(), units.end());
}

std::vector<Golden> const Goldens = {
    {"nothing", [](CKF_File*) {},
     std::string("KFSF\0\0\0\x18"
                 "projvers\0\0\0\x0C\0\0\0\x5F\0\0\0\0\0\0\0\0",
                 32)},
    {"an even atom", [](CKF_File* f) { CKF_WriteAtom(f, CKF_Id("cdat"), 2, "ab"); },
     Form(std::string("cdat\0\0\0\2ab", 10))},
    {"an odd atom is padded with a zero", [](CKF_File* f) { CKF_WriteAtom(f, CKF_Id("cdat"), 3, "abc"); },
     Form(std::string("cdat\0\0\0\3abc\0", 12))},
    {"an empty atom", [](CKF_File* f) { CKF_WriteAtom(f, CKF_Id("cdat"), 0, nullptr); },
     Form(std::string("cdat\0\0\0\0", 8))},
    {"lists hold what was written, whatever the hint said", WriteNested,
     Form(std::string("LIST\0\0\0\x28kfgp"
                      "LIST\0\0\0\x10kfbs"
                      "kfsb\0\0\0\4\1\2\3\4"
                      "kfix\0\0\0\4last",
                      48))},
    {"an empty list", [](CKF_File* f) { const CKF_ScWriteList list(f, CKF_Id("kfgp"), 0); }, Form(List("kfgp", ""))},
    {"a text of any script",
     [](CKF_File* f) {
         CKF_WriteString(f, CKF_Id("kfsn"), Units({'a', 0xE4, 0x20AC, 0xD83D, 0xDE00}), 0);
     },
     Form(Atom("kfsn", "a\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80"))},
    {"surrogates without a partner",
     [](CKF_File* f) {
         CKF_WriteUTF16(f, Units({0xDC00, 'x', 0xD83D}));
     },
     Form(Atom("Utf8", "\xED\xB0\x80x\xED\xA0\xBD"))},
    {"a text cut to its limit", [](CKF_File* f) { CKF_WriteString(f, CKF_Id("kfsn"), Text("abcdef"), 4); },
     Form(Atom("kfsn", "abcd"))},
    {"a limit never cuts a pair",
     [](CKF_File* f) {
         CKF_WriteString(f, CKF_Id("kfsn"), Units({'a', 0xD83D, 0xDE00}), 2);
     },
     Form(Atom("kfsn", "a"))},
    {"a handle", WriteHandle, Form(Atom("expr", "time*"))},
};

TEST(ChunkFileBytes, AreExact)
{
    for (Golden const& golden : Goldens) {
        SCOPED_TRACE(golden.why);
        CKF_File file;
        ASSERT_EQ(0, file.CreateInMemory());
        golden.write(&file);
        ASSERT_EQ(0, file.Commit()) << file.LastErrorText();
        EXPECT_EQ(golden.bytes, Bytes(file));
    }
}

TEST(ChunkFileBytes, VersionAndEncodingStandInTheFile)
{
    CKF_File file;
    file.SetVersion(71, -2);
    file.textEncoding = CKF_TextEncoding_Latin1;
    ASSERT_EQ(0, file.CreateInMemory());
    ASSERT_EQ(0, file.Commit());
    EXPECT_EQ(Form("", 71, 0xFFFFFFFEu, 1), Bytes(file));
    CKF_File read;
    ASSERT_EQ(0, read.Open(file.GetBytes()));
    EXPECT_EQ(std::tuple(71, -2, true),
              std::tuple(read.majorVersion, read.minorVersion, read.textEncoding == CKF_TextEncoding_Latin1));
}

// ---- texts

TEST(ChunkFileText, EveryTextComesBackUnitForUnit)
{
    // Units around all borders of UTF-8 and UTF-16, in all sequences of three.
    std::vector<int> const units = {0,      'a',    0x7F,   0x80,   0x7FF,  0x800,  0xD7FF,
                                    0xD800, 0xDBFF, 0xDC00, 0xDFFF, 0xE000, 0xFFFD, 0xFFFF};
    std::vector<u16str> texts = {{}};
    for (int const a : units)
        for (int const b : units)
            for (int const c : units) texts.push_back(Units({a, b, c}));

    CKF_File file;
    ASSERT_EQ(0, file.CreateInMemory());
    for (u16str const& text : texts) {
        CKF_WriteUTF16(&file, text);
        ASSERT_EQ(0, CKF_WriteString(&file, CKF_Id("kfsn"), text, 0));
    }
    ASSERT_EQ(0, file.Commit());

    CKF_File read;
    ASSERT_EQ(0, read.Open(file.GetBytes()));
    for (u16str const& text : texts) {
        u16str back = Text("old"), again = Text("old");
        CKF_ReadUTF16(&read, &back, nullptr);
        EXPECT_EQ(text, back);
        ASSERT_TRUE(CKF_ReadString(&read, nullptr, CKF_Id("kfsn"), &again, Text("fallback"), 0));
        EXPECT_EQ(text, again);
    }
}

TEST(ChunkFileText, HandlesAreDecodedWithTheFilesEncoding)
{
    const struct {
        char const* why;
        std::string bytes;
        CKF_TextEncoding encoding;
        u16str text;
    } rows[] = {
        {"nothing", "", CKF_TextEncoding_Latin1, {}},
        {"ascii", "wiggle(1)", CKF_TextEncoding_Utf8, Text("wiggle(1)")},
        {"a Latin-1 text", "\xE4\xFF", CKF_TextEncoding_Latin1, Units({0xE4, 0xFF})},
        {"UTF-8", "\xC3\xA4", CKF_TextEncoding_Utf8, Units({0xE4})},
        {"the mark counts more than the file", "\xEF\xBB\xBF\xC3\xA4", CKF_TextEncoding_Latin1, Units({0xE4})},
        {"two thirds of a mark", "\xEF\xBB", CKF_TextEncoding_Latin1, Units({0xEF, 0xBB})},
        {"an encoding of a later build is taken for UTF-8", "\xC3\xA4", {77}, Units({0xE4})},
        {"ill-formed", "a\xFFz", CKF_TextEncoding_Utf8, Units({'a', 0xFFFD, 'z'})},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.why);
        const std::string bytes = Form(Atom("expr", row.bytes));
        CKF_File file;
        ASSERT_EQ(0, file.Open(Span(bytes)));
        char** handle = nullptr;
        ASSERT_EQ(0, CKF_ReadHandle(&file, nullptr, CKF_Id("expr"), &handle));
        EXPECT_EQ(row.bytes.size(), Q_GetHandleSize(handle));
        EXPECT_EQ(row.text, CKF_ConvertHandleToStringAndDisposeIfEncoded(&handle, &row.encoding));
        EXPECT_EQ(nullptr, handle);
    }
    char** none = nullptr;
    EXPECT_TRUE(CKF_ConvertHandleToStringAndDisposeIfEncoded(&none, nullptr).empty());
}

TEST(ChunkFileText, AHandleMadeHereSurvivesAnyEncodingOfTheFile)
{
    const Q_MemoryCount before = Q_MemoryLive("text handle");
    for (u16str const& text : {Text("value + 1"), Units({0xE4, 0xD800, 0x20AC}), u16str()})
        for (CKF_TextEncoding const encoding : {CKF_TextEncoding_Utf8, CKF_TextEncoding_Latin1}) {
            char** handle = CKF_NewHandleFromString(text, true);
            ASSERT_NE(nullptr, handle);
            EXPECT_EQ(text, CKF_ConvertHandleToStringAndDisposeIfEncoded(&handle, &encoding));
        }
    EXPECT_EQ(before, Q_MemoryLive("text handle"));
    char** const plain = CKF_NewHandleFromString(Units({0xE4}), false);
    EXPECT_EQ("\xC3\xA4", std::string(*plain, Q_GetHandleSize(plain))) << "no mark where none is wanted";
    Q_FreeHandle(plain);
}

// ---- versions

TEST(ChunkFileVersions, EffectivePairs)
{
    const struct {
        int major, minor, effectiveMajor, effectiveMinor;
    } rows[] = {
        {55, 0, 55, 0}, {88, 2, 88, 2}, {88, 3, 88, 3}, {94, 9999, 94, 9999}, {95, 0, 95, 0},
        {95, 1, 95, 0}, {96, 0, 95, 0}, {-1, 7, 0, 7},  {7, -1, 7, 0},
    };
    for (auto const& row : rows) {
        int major = row.major, minor = row.minor;
        CKF_GetEffectiveProjectVersion(&major, &minor);
        EXPECT_EQ(std::pair(row.effectiveMajor, row.effectiveMinor), std::pair(major, minor))
            << row.major << '.' << row.minor;
    }
    CKF_File file;
    for (int const major : {0, 56, 71, 72, 95, 200}) {
        file.majorVersion = major;
        EXPECT_EQ(major < 72, CKF_Version_Gen7_PreUnicode(&file)) << major;
    }
}

// ---- misuse while writing

TEST(ChunkFileWriting, AMisuseFailsTheWholeSave)
{
    static CKF_ChunkInfo chunk, inner;
    constexpr int bad = CKF_Err_BadArgument;
    const struct {
        char const* why;
        std::function<int(CKF_File*)> call;
        int code;
    } rows[] = {
        {"a list as an atom", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_ListId, 0, nullptr); }, bad},
        {"no id", [](CKF_File* f) { return CKF_WriteAtom(f, 0, 0, nullptr); }, bad},
        {"the id of the whole file", [](CKF_File* f) { return CKF_WriteString(f, CKF_Id("KFSF"), {}, 0); }, bad},
        {"a negative size", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("cdat"), -1, "x"); }, bad},
        {"no data", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("cdat"), 1, nullptr); }, bad},
        {"no handle", [](CKF_File* f) { return CKF_WriteHandle(f, CKF_Id("expr"), nullptr); }, bad},
        {"chunks in an atom", [](CKF_File* f) { return CKF_BeginChunkWrite(f, CKF_Id("cdat"), 0, 0, &chunk); }, bad},
        {"no list type", [](CKF_File* f) { return CKF_BeginChunkWrite(f, CKF_ListId, 0, 0, &chunk); }, bad},
        {"no list", [](CKF_File* f) { return SEQ_Write(nullptr, f); }, SEQ_Err_BadList},
        {"reading", [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("cdat"), nullptr, 0, nullptr); }, CKF_Err_NotOpen},
        {"an end without a beginning",
         [](CKF_File* f) {
             chunk = {};
             return CKF_EndChunkWrite(f, &chunk);
         },
         CKF_Err_Unbalanced},
        {"the outer list is closed first",
         [](CKF_File* f) {
             CKF_BeginChunkWrite(f, CKF_ListId, 0, CKF_Id("kfgp"), &chunk);
             CKF_BeginChunkWrite(f, CKF_ListId, 0, CKF_Id("kfbs"), &inner);
             return CKF_EndChunkWrite(f, &chunk);
         },
         CKF_Err_Unbalanced},
        {"a list that is still open",
         [](CKF_File* f) {
             CKF_BeginChunkWrite(f, CKF_ListId, 0, CKF_Id("kfgp"), &chunk);
             return f->Commit();
         },
         CKF_Err_Unbalanced},
        {"lists beyond the depth that a reader takes",
         [](CKF_File* f) {
             for (int i = 0; i < CKF_MaxDepth; ++i)
                 EXPECT_EQ(0, CKF_BeginChunkWrite(f, CKF_ListId, 0, CKF_Id("kfgp"), &chunk)) << i;
             return CKF_BeginChunkWrite(f, CKF_ListId, 0, CKF_Id("kfgp"), &chunk);
         },
         CKF_Err_TooDeep},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.why);
        CKF_File file;
        ASSERT_EQ(0, file.CreateInMemory());
        EXPECT_EQ(row.code, row.call(&file));
        std::string const text = file.LastErrorText();
        EXPECT_NE("", text);
        EXPECT_EQ(row.code, CKF_WriteAtom(&file, CKF_Id("cdat"), 2, "ok")) << "a good call after it";
        EXPECT_EQ(row.code, Thrown([&] { CKF_WriteUTF16(&file, {}); }));
        EXPECT_EQ(row.code, Thrown([&] { const CKF_ScWriteList list(&file, CKF_Id("kfgp"), 0); }));
        EXPECT_EQ(row.code, file.Commit());
        EXPECT_EQ(row.code, file.LastError());
        EXPECT_EQ(text, file.LastErrorText()) << "the first failure is the one that is told";
        EXPECT_TRUE(file.GetBytes().empty());
        EXPECT_EQ(0, file.CreateInMemory());
        EXPECT_EQ(0, file.Commit()) << "and a new beginning is a new beginning";
    }
}

TEST(ChunkFileWriting, ScopedListsAreClosedWhileAnExceptionPasses)
{
    CKF_File file;
    ASSERT_EQ(0, file.CreateInMemory());
    EXPECT_EQ(99, Thrown([&] {
                  const CKF_ScWriteList outer(&file, CKF_Id("kfgp"), 0);
                  const CKF_ScWriteList inner(&file, CKF_Id("kfbs"), 0);
                  CKF_WriteAtom(&file, CKF_Id("cdat"), 2, "ab");
                  throw 99;
              }));
    ASSERT_EQ(0, file.Commit());
    EXPECT_EQ(Form(List("kfgp", List("kfbs", Atom("cdat", "ab")))), Bytes(file));
}

TEST(ChunkFileWriting, TheSizeLimitIsExact)
{
    const std::size_t whole = Form(List("kfgp", Atom("cdat", "abc"))).size();
    for (std::size_t const limit : {whole, whole - 1, whole - 2, std::size_t{44}, std::size_t{43}, std::size_t{32},
                                    std::size_t{31}, std::size_t{0}}) {
        SCOPED_TRACE(limit);
        CKF_File file;
        file.SetMaxSize(static_cast<std::uint32_t>(limit));
        int const created = file.CreateInMemory();
        EXPECT_EQ(limit < 32 ? CKF_Err_TooBig : 0, created);
        if (created != 0) continue;
        int const begun = Thrown([&] {
            const CKF_ScWriteList list(&file, CKF_Id("kfgp"), 0);
            CKF_WriteAtom(&file, CKF_Id("cdat"), 3, "abc");
        });
        EXPECT_EQ(limit < 44 ? CKF_Err_TooBig : 0, begun);
        EXPECT_EQ(limit < whole ? CKF_Err_TooBig : 0, file.Commit());
    }
}

}  // namespace
