// Chunk files as they should be: golden bytes, any tree written and read in any way, texts, and misuse.
#include "tests/services/chunkbytes.h"
#include "tests/support/dice.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <algorithm>
#include <functional>
#include <vector>

namespace {

struct Golden {
    char const* why;
    std::function<void(CKF_File*)> write;
    std::string bytes;
};

std::vector<Golden> const Goldens = {
    {"nothing", [](CKF_File*) {},
     std::string("KFSF\0\0\0\x18"
                 "projvers\0\0\0\x0C\0\0\0\x5F\0\0\0\0\0\0\0\0",
                 32)},
    {"an even atom", [](CKF_File* f) { EXPECT_EQ(0, CKF_WriteAtom(f, CKF_Id("cdat"), 2, "ab")); },
     Form(std::string("cdat\0\0\0\2ab", 10))},
    {"an odd atom is padded with a zero", [](CKF_File* f) { EXPECT_EQ(0, CKF_WriteAtom(f, CKF_Id("cdat"), 3, "abc")); },
     Form(std::string("cdat\0\0\0\3abc\0", 12))},
    {"an empty atom", [](CKF_File* f) { EXPECT_EQ(0, CKF_WriteAtom(f, CKF_Id("cdat"), 0, nullptr)); },
     Form(std::string("cdat\0\0\0\0", 8))},
    {"lists hold what was written, whatever the hint said",
     [](CKF_File* f) {
         CKF_ScWriteList const outer(f, CKF_Id("kfgp"), 1234);
         {
             CKF_ScWriteList const inner(f, CKF_Id("kfbs"), 0);
             EXPECT_EQ(0, CKF_WriteAtom(f, CKF_Id("kfsb"), 4, "\1\2\3\4"));
         }
         EXPECT_EQ(0, CKF_WriteAtom(f, CKF_Id("kfix"), 4, "last"));
     },
     Form(std::string("LIST\0\0\0\x28kfgpLIST\0\0\0\x10kfbskfsb\0\0\0\4\1\2\3\4kfix\0\0\0\4last", 48))},
    {"a text of any script",
     [](CKF_File* f) {
         EXPECT_EQ(0, CKF_WriteString(f, CKF_Id("kfsn"), Units({'a', 0xE4, 0x20AC, 0xD83D, 0xDE00}), 0));
     },
     Form(Atom("kfsn", "a\xC3\xA4\xE2\x82\xAC\xF0\x9F\x98\x80"))},
    {"surrogates without a partner",
     [](CKF_File* f) {
         CKF_WriteUTF16(f, Units({0xDC00, 'x', 0xD83D}));
     },
     Form(Atom("Utf8", "\xED\xB0\x80x\xED\xA0\xBD"))},
    {"a text cut to its limit",
     [](CKF_File* f) { EXPECT_EQ(0, CKF_WriteString(f, CKF_Id("kfsn"), Text("abcdef"), 4)); },
     Form(Atom("kfsn", "abcd"))},
    {"a limit never cuts a pair",
     [](CKF_File* f) {
         EXPECT_EQ(0, CKF_WriteString(f, CKF_Id("kfsn"), Units({'a', 0xD83D, 0xDE00}), 2));
     },
     Form(Atom("kfsn", "a"))},
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

// ---- any tree, written and read in any way

struct Node {
    std::string id, type, data;  // the type of a list, the data of an atom
    std::vector<Node> children;
};

std::vector<Node> RandomNodes(Dice& dice, int depth)
{
    std::vector<Node> nodes(static_cast<std::size_t>(dice.Below(5)));
    for (Node& node : nodes) {
        if (depth > 0 && dice.Below(3) == 0) {
            node = {"LIST", dice.Below(2) ? "kfgp" : "kfbs", "", RandomNodes(dice, depth - 1)};
            continue;
        }
        char const* const ids[] = {"aaaa", "bbbb", "kfsn", "kfbs"};
        node = {ids[dice.Below(4)], "", std::string(static_cast<std::size_t>(dice.Below(9)), '\0'), {}};
        for (char& byte : node.data)
            byte = static_cast<char>(node.id == "kfsn" ? 'a' + dice.Below(26) : dice.Below(256));
    }
    return nodes;
}

std::string BytesOf(std::vector<Node> const& nodes)
{
    std::string bytes;
    for (Node const& node : nodes)
        bytes += node.type.empty() ? Atom(node.id, node.data) : List(node.type, BytesOf(node.children));
    return bytes;
}

int IdOf(std::string const& letters)
{
    int id = 0;
    for (char const letter : letters) id = id << 8 | letter;
    return id;
}

void Write(CKF_File* file, std::vector<Node> const& nodes, Dice& dice)
{
    for (Node const& node : nodes) {
        int const id = IdOf(node.id), size = static_cast<int>(node.data.size());
        if (!node.type.empty() && dice.Below(2)) {
            EXPECT_EQ(99, Thrown([&] {
                          CKF_ScWriteList const list(file, IdOf(node.type), 0);
                          Write(file, node.children, dice);
                          throw 99;  // a scoped list is closed while an exception passes
                      }));
        } else if (!node.type.empty()) {
            CKF_ChunkInfo chunk{};
            EXPECT_EQ(0, CKF_BeginChunkWrite(file, id, dice.Below(5000), IdOf(node.type), &chunk));
            Write(file, node.children, dice);
            EXPECT_EQ(0, CKF_EndChunkWrite(file, &chunk));
            EXPECT_EQ(BytesOf(node.children).size(), chunk.size);
        } else if (node.id == "kfsn") {
            EXPECT_EQ(0, CKF_WriteString(file, id, Text(node.data.c_str()), 0));
        } else if (dice.Below(3) == 0) {
            char** const handle = Q_AllocateHandleClear(0, "test", node.data.size());
            node.data.copy(*handle, node.data.size());
            EXPECT_EQ(0, CKF_WriteHandle(file, id, handle));
            Q_FreeHandle(handle);
        } else {
            EXPECT_EQ(0, CKF_WriteAtom(file, id, size, node.data.data()));
        }
    }
}

// Asks for this and that at one level, in any order, and knows what must come: the next chunk that fits, found from
// where the last one ended, or none, which leaves the position.
void Read(CKF_File* file, std::vector<Node> const& nodes, CKF_ChunkInfo const* info, Dice& dice)
{
    char const* const ids[] = {"aaaa", "bbbb", "kfsn", "kfbs", "LIST", "none"};
    std::size_t position = 0;
    for (int step = dice.Below(8); step >= 0; --step) {
        CKF_ChunkInfo const* const parent = dice.Below(2) ? info : nullptr;
        int const kind = dice.Below(5);
        std::string id = ids[dice.Below(kind < 3 ? 4 : 6)], type;
        if (kind == 2) id = "kfsn";
        if (kind >= 3 && dice.Below(2)) type = dice.Below(2) ? "kfgp" : "kfbs";
        if (kind >= 3 && dice.Below(2)) id = type.empty() ? "" : "LIST";
        std::size_t next = position;
        while (next < nodes.size() &&
               !((id.empty() || nodes[next].id == id) && (type.empty() || nodes[next].type == type)))
            ++next;
        bool const there = next < nodes.size();
        int const code = there ? 0 : CKF_Err_NoSuchChunk;
        std::string const data = there ? nodes[next].data : "";
        if (there) position = next + 1;
        if (kind == 0) {
            std::size_t const size = static_cast<std::size_t>(dice.Below(12)), copied = std::min(size, data.size());
            std::string buffer(16, '.');
            EXPECT_EQ(code, CKF_ReadAtom(file, IdOf(id), parent, static_cast<int>(size), buffer.data()));
            EXPECT_EQ(data.substr(0, copied) + std::string(16 - copied, '.'), buffer);
        } else if (kind == 1) {
            char** handle = nullptr;
            EXPECT_EQ(code, CKF_ReadHandle(file, parent, IdOf(id), &handle));
            EXPECT_EQ(data, handle ? std::string(*handle, Q_GetHandleSize(handle)) : "");
            Q_FreeHandle(handle);
        } else if (kind == 2) {
            u16str text = Text("old");
            EXPECT_EQ(there, CKF_ReadString(file, parent, IdOf(id), &text, Text("fallback"), 0));
            EXPECT_EQ(Text(there ? data.c_str() : "fallback"), text);
        } else {
            bool found = !there;
            bool const asks = dice.Below(2);
            EXPECT_EQ(there  ? 99
                      : asks ? 0
                             : code,
                      Thrown([&] {
                          CKF_ScDescend descent;
                          descent.Descend(file, IdOf(id), IdOf(type), parent, asks ? &found : nullptr);
                          EXPECT_EQ(asks ? there : !there, found);
                          EXPECT_EQ(there ? IdOf(nodes[next].id) : 0, descent.GetChunkInfo()->id);
                          EXPECT_EQ(there ? IdOf(nodes[next].type) : 0, descent.GetChunkInfo()->listType);
                          if (!there) return;
                          if (!nodes[next].type.empty()) {
                              Read(file, nodes[next].children, descent.GetChunkInfo(), dice);
                          } else if (!data.empty()) {
                              std::string pieces(data.size(), '.');
                              int first = dice.Below(static_cast<int>(data.size())), rest = dice.Below(2);
                              EXPECT_EQ(0, CKF_ReadChunkData(file, &first, pieces.data()));
                              EXPECT_EQ(0, CKF_ReadChunkData(file, &rest, pieces.data() + first));
                              std::size_t const read = static_cast<std::size_t>(first + rest);
                              EXPECT_EQ(data.substr(0, read), pieces.substr(0, read));
                          }
                          throw 99;  // a descent left early is behind its chunk
                      }));
        }
        ASSERT_EQ(0, file->LastError()) << "a chunk that isn't there is an answer";
    }
}

TEST(ChunkFile, AnyTreeIsWhatItsBytesSayAndIsFoundInAnyOrder)
{
    Dice dice(7);
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (int round = 0; round < Rounds(400) && !testing::Test::HasFailure(); ++round) {
        SCOPED_TRACE(round);
        std::vector<Node> const nodes = RandomNodes(dice, 4);
        CKF_File file;
        file.SetVersion(71, -2);
        file.textEncoding = CKF_TextEncoding_Latin1;
        ASSERT_EQ(0, file.CreateInMemory());
        Write(&file, nodes, dice);
        ASSERT_EQ(0, file.Commit()) << file.LastErrorText();
        ASSERT_EQ(Form(BytesOf(nodes), 71, 0xFFFFFFFEu, 1), Bytes(file));
        for (int reading = 0; reading < 5; ++reading) {
            CKF_File read;
            ASSERT_EQ(0, read.Open(file.GetBytes()));
            EXPECT_TRUE(read.majorVersion == 71 && read.minorVersion == -2);
            EXPECT_EQ(CKF_TextEncoding_Latin1, read.textEncoding);
            Read(&read, nodes, nullptr, dice);
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
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

using Call = int (*)(CKF_File*);

CKF_ChunkInfo firstList, secondList;

int BeginList(CKF_File* file, CKF_ChunkInfo* list = &firstList)
{
    return CKF_BeginChunkWrite(file, CKF_ListId, 0, CKF_Id("kfgp"), list);
}

TEST(ChunkFileWriting, AMisuseFailsTheWholeSave)
{
    Call const none = [](CKF_File* f) { return CKF_EndChunkWrite(f, &(firstList = {})); };
    Call const outer = [](CKF_File* f) {
        return BeginList(f) + BeginList(f, &secondList) + CKF_EndChunkWrite(f, &firstList);
    };
    Call const open = [](CKF_File* f) { return BeginList(f) + f->Commit(); };
    Call const deep = [](CKF_File* f) {
        for (int i = 0; i < CKF_MaxDepth; ++i) EXPECT_EQ(0, BeginList(f)) << i;
        return BeginList(f);
    };
    constexpr int bad = CKF_Err_BadArgument, unbalanced = CKF_Err_Unbalanced;
    const struct {
        char const* why;
        Call call;
        int code;
    } rows[] = {
        {"a list as atom", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_ListId, 0, nullptr); }, bad},
        {"no id", [](CKF_File* f) { return CKF_WriteAtom(f, 0, 0, nullptr); }, bad},
        {"the id of the file", [](CKF_File* f) { return CKF_WriteString(f, CKF_Id("KFSF"), {}, 0); }, bad},
        {"a negative size", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("cdat"), -1, "x"); }, bad},
        {"no data", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("cdat"), 1, nullptr); }, bad},
        {"no handle", [](CKF_File* f) { return CKF_WriteHandle(f, CKF_Id("expr"), nullptr); }, bad},
        {"no list", [](CKF_File* f) { return CKF_BeginChunkWrite(f, CKF_Id("cdat"), 0, 0, &firstList); }, bad},
        {"no list type", [](CKF_File* f) { return CKF_BeginChunkWrite(f, CKF_ListId, 0, 0, &firstList); }, bad},
        {"no items", [](CKF_File* f) { return SEQ_Write(nullptr, f); }, SEQ_Err_BadList},
        {"reading", [](CKF_File* f) { return CKF_ReadAtom(f, 1, nullptr, 0, nullptr); }, CKF_Err_NotOpen},
        {"an end without a beginning", none, unbalanced},
        {"the outer list is closed first", outer, unbalanced},
        {"a list that is still open", open, unbalanced},
        {"lists beyond the depth that a reader takes", deep, CKF_Err_TooDeep},
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

TEST(ChunkFileWriting, TheSizeLimitIsExact)
{
    std::size_t const whole = Form(List("kfgp", Atom("cdat", "abc"))).size();
    for (std::size_t const limit : {whole, whole - 1, whole - 2, std::size_t{44}, std::size_t{43}, std::size_t{32},
                                    std::size_t{31}, std::size_t{0}}) {
        SCOPED_TRACE(limit);
        CKF_File file;
        file.SetMaxSize(static_cast<std::uint32_t>(limit));
        int const created = file.CreateInMemory();
        EXPECT_EQ(limit < 32 ? CKF_Err_TooBig : 0, created);
        if (created != 0) continue;
        int const begun = Thrown([&] {
            CKF_ScWriteList const list(&file, CKF_Id("kfgp"), 0);
            static_cast<void>(CKF_WriteAtom(&file, CKF_Id("cdat"), 3, "abc"));  // the commit tells
        });
        EXPECT_EQ(limit < 44 ? CKF_Err_TooBig : 0, begun);
        EXPECT_EQ(limit < whole ? CKF_Err_TooBig : 0, file.Commit());
    }
}

// ---- failures while reading

TEST(ChunkFileReading, AFailureStays)
{
    Call const find = [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, 0, nullptr); };
    Call const noPlace = [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, 1, nullptr); };
    Call const negative = [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, -1, f); };
    Call const write = [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("aaaa"), 0, nullptr); };
    auto const readThree = [](CKF_File* f) {
        CKF_ScDescend const first(f, 0, 0, nullptr, nullptr);
        int size = 3;
        char data[4];
        return CKF_ReadChunkData(f, &size, data);
    };
    auto const searchOutside = [](CKF_File* f) {
        CKF_ScDescend const list(f, 0, 0, nullptr, nullptr);
        CKF_ChunkInfo wrong = *list.GetChunkInfo();
        wrong.offset += 12;
        return CKF_ReadAtom(f, CKF_Id("aaaa"), &wrong, 0, nullptr);
    };
    auto const searchOuter = [](CKF_File* f) {
        CKF_ScDescend const outer(f, 0, 0, nullptr, nullptr);
        CKF_ScDescend const inner(f, 0, 0, nullptr, nullptr);
        return CKF_ReadAtom(f, CKF_Id("aaaa"), outer.GetChunkInfo(), 0, nullptr);
    };
    auto const searchInAtom = [](CKF_File* f) {
        CKF_ScDescend const atom(f, 0, 0, nullptr, nullptr);
        return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, 0, nullptr);
    };
    auto const useTwice = [](CKF_File* f) {
        CKF_ScDescend list(f, 0, 0, nullptr, nullptr);
        return Thrown([&] { list.Descend(f, 0, 0, nullptr, nullptr); });
    };
    std::string const list = List("kfgp", List("kfbs", ""));
    const struct {
        char const* why;
        std::string content;
        Call call;
        int code;
        std::uint64_t offset;
    } rows[] = {
        {"more data than there is", Atom("aaaa", "12"), readThree, CKF_Err_PastEnd, 40},
        {"a list that isn't open", list, searchOutside, CKF_Err_Unbalanced, 44},
        {"a list that isn't the innermost", list, searchOuter, CKF_Err_Unbalanced, 56},
        {"chunks in an atom", Atom("bbbb", "12"), searchInAtom, CKF_Err_BadArgument, 40},
        {"data of a list", list, readThree, CKF_Err_BadArgument, 44},
        {"a descent that is in use", list, useTwice, CKF_Err_Unbalanced, 44},
        {"an atom without a place", Atom("aaaa", "12"), noPlace, CKF_Err_BadArgument, 0},
        {"a negative size", Atom("aaaa", "12"), negative, CKF_Err_BadArgument, 0},
        {"writing", "", write, CKF_Err_NotOpen, 0},
        {"a length beyond the file", "bbbb" + Long(3) + "ab", find, CKF_Err_Corrupt, 32},
        {"a huge length", "bbbb" + Long(0xFFFFFFFFu) + "ab", find, CKF_Err_Corrupt, 32},
        {"half a header", "bbbb" + Long(2) + "abhalf", find, CKF_Err_Corrupt, 42},
        {"a list without room for its type", "LIST" + Long(2) + "ab", find, CKF_Err_Corrupt, 32},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.why);
        std::string const bytes = Form(row.content);
        CKF_File file;
        ASSERT_EQ(0, file.Open(Span(bytes)));
        EXPECT_EQ(row.code, row.call(&file));
        EXPECT_EQ(row.code, file.LastError());
        EXPECT_EQ(row.offset, file.LastErrorOffset());
        EXPECT_STRNE("", file.LastErrorText());
        EXPECT_EQ(row.code, find(&file));
        bool found = true;
        EXPECT_EQ(row.code, Thrown([&] { CKF_ScDescend const any(&file, 0, 0, nullptr, &found); }));
        EXPECT_FALSE(found);
        u16str text;
        EXPECT_EQ(row.code, Thrown([&] { CKF_ReadString(&file, nullptr, CKF_Id("kfsn"), &text, {}, 0); }));
        EXPECT_EQ(0, file.Open(Span(bytes))) << "opened again it is as good as before";
    }
}

TEST(ChunkFileReading, NothingIsOpenInTheBeginning)
{
    CKF_File file, other;
    EXPECT_EQ(0, file.LastError());
    EXPECT_EQ(CKF_Err_NotOpen, CKF_ReadAtom(&file, CKF_Id("aaaa"), nullptr, 0, nullptr));
    EXPECT_EQ(CKF_Err_NotOpen, other.Commit());
    EXPECT_EQ(CKF_Err_BadArgument, CKF_WriteAtom(nullptr, CKF_Id("aaaa"), 0, nullptr));
    EXPECT_EQ(CKF_Err_BadArgument, other.Open(static_cast<char const*>(nullptr)));
    EXPECT_EQ(CKF_Err_BadArgument, other.Create(nullptr));
}

}  // namespace
