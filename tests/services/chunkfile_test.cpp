// Chunk files as they should be: any tree written and read in any way, texts, and misuse.
#include "tests/services/chunkbytes.h"
#include "tests/support/codes.h"
#include "tests/support/dice.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <algorithm>
#include <cstring>
#include <functional>
#include <tuple>
#include <vector>

namespace {

// ---- any tree, written and read in any way

struct Node {
    std::string id, type, data;  // the type of a list, the data of an atom
    std::vector<Node> children;
    u16str text = {}, kept = {};  // what is written as a text, and what its limit leaves of it
    unsigned limit = 0;
};

std::vector<Node> RandomNodes(Dice& dice, int depth)
{
    std::vector<Node> nodes(static_cast<std::size_t>(dice.Below(5)));
    for (Node& node : nodes) {
        if (depth > 0 && dice.Below(3) == 0) {
            node = {"LIST", dice.Below(2) ? "kfgp" : "kfbs", "", RandomNodes(dice, depth - 1)};
            continue;
        }
        char const* const ids[] = {"aaaa", "bbbb", "kfsn", "kfbs", "Utf8"};
        node = {ids[dice.Below(5)], "", std::string(static_cast<std::size_t>(dice.Below(9)), '\0'), {}};
        for (char& byte : node.data) byte = static_cast<char>(dice.Below(256));
        if (node.id != "kfsn" && node.id != "Utf8") continue;
        // Around all borders of UTF-8 and UTF-16.
        int const units[] = {0,      'a',    0x7F,   0x80,   0x7FF,  0x800,  0xD7FF,
                             0xD800, 0xDBFF, 0xDC00, 0xDFFF, 0xE000, 0xFFFD, 0xFFFF};
        for (int i = dice.Below(6); i > 0; --i) node.text += Units({units[dice.Below(std::size(units))]});
        node.limit = node.id == "kfsn" ? static_cast<unsigned>(dice.Below(4)) : 0;
        node.kept = node.text.substr(0, node.limit ? node.limit : 9);
        std::size_t const size = node.kept.size();
        if (size < node.text.size() && node.kept.back() / 0x400 == 0x36 && node.text[size] / 0x400 == 0x37)
            node.kept.pop_back();  // half of a pair
        node.data = PlainUtf8(node.kept);
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
            EXPECT_EQ(0, CKF_WriteString(file, id, node.text, node.limit));
        } else if (node.id == "Utf8") {
            EXPECT_EQ(0, CKF_WriteUTF16(file, node.text));
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
    char const* const ids[] = {"aaaa", "bbbb", "kfsn", "kfbs", "Utf8", "LIST", "none"};
    std::size_t position = 0;
    for (int step = dice.Below(8); step >= 0; --step) {
        CKF_ChunkInfo const* const parent = dice.Below(2) ? info : nullptr;
        int const kind = dice.Below(5);
        std::string id = ids[dice.Below(kind < 3 ? 5 : 7)], type;
        if (kind == 2) id = dice.Below(2) ? "kfsn" : "Utf8";
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
            if (id == "Utf8")
                EXPECT_EQ(code, Thrown([&] { CKF_ReadUTF16(file, &text, parent); }));
            else
                EXPECT_EQ(there, CKF_ReadString(file, parent, IdOf(id), &text, Text("fallback"), 0));
            EXPECT_EQ(there ? nodes[next].kept : Text(id == "Utf8" ? "old" : "fallback"), text);
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
    CKF_File empty;
    EXPECT_EQ(0, empty.CreateInMemory() + empty.Commit());
    EXPECT_EQ(std::string("KFSF\0\0\0\x18projvers\0\0\0\x0C\0\0\0\x5F\0\0\0\0\0\0\0\0", 32), Bytes(empty));
    Dice dice(7);
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (int round = 0; round < Rounds(400) && !testing::Test::HasFailure(); ++round) {
        SCOPED_TRACE(round);
        std::vector<Node> const nodes = RandomNodes(dice, 4);
        std::string const bytes = Form(BytesOf(nodes), 71, 0xFFFFFFFEu, 1);
        CKF_File file;
        file.SetVersion(71, -2);
        file.textEncoding = CKF_TextEncoding_Latin1;
        file.SetMaxSize(static_cast<std::uint32_t>(bytes.size()));  // a limit that is just enough
        ASSERT_EQ(0, file.CreateInMemory());
        Write(&file, nodes, dice);
        ASSERT_EQ(0, file.Commit()) << file.LastErrorText();
        ASSERT_EQ(bytes, Bytes(file));
        for (int reading = 0; reading < 5; ++reading) {
            CKF_File read;
            ASSERT_EQ(0, read.Open(file.GetBytes()));
            EXPECT_TRUE(read.majorVersion == 71 && read.minorVersion == -2);
            EXPECT_EQ(CKF_TextEncoding_Latin1, read.textEncoding);
            Read(&read, nodes, nullptr, dice);
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    for (unsigned const limit : {56u, 55u, 54u, 44u, 43u, 32u, 31u, 0u}) {  // 56: a list, and an atom of three bytes
        SCOPED_TRACE(limit);
        CKF_File file;
        file.SetMaxSize(limit);
        EXPECT_EQ(limit < 32 ? CKF_Err_TooBig : 0, file.CreateInMemory());
        EXPECT_EQ(limit < 44 ? CKF_Err_TooBig : 0, Thrown([&] {
                      CKF_ScWriteList const list(&file, CKF_Id("kfgp"), 0);
                      EXPECT_EQ(limit < 56 ? CKF_Err_TooBig : 0, CKF_WriteAtom(&file, CKF_Id("cdat"), 3, "abc"));
                  }));
        EXPECT_EQ(limit < 56 ? CKF_Err_TooBig : 0, file.Commit());
    }
}

// ---- texts

TEST(ChunkFileText, HandlesAreDecodedWithTheFilesEncoding)
{
    using Row = std::tuple<char const*, CKF_TextEncoding, u16str>;
    Row const rows[] = {{"", CKF_TextEncoding_Latin1, {}},
                        {"wiggle(1)", CKF_TextEncoding_Utf8, Text("wiggle(1)")},
                        {"\xE4\xFF", CKF_TextEncoding_Latin1, Units({0xE4, 0xFF})},
                        {"\xC3\xA4", CKF_TextEncoding_Utf8, Units({0xE4})},
                        {"\xEF\xBB\xBF\xC3\xA4", CKF_TextEncoding_Latin1, Units({0xE4})},  // the mark counts more
                        {"\xEF\xBB", CKF_TextEncoding_Latin1, Units({0xEF, 0xBB})},
                        {"\xC3\xA4", {77}, Units({0xE4})},  // of a later build
                        {"a\xFFz", CKF_TextEncoding_Utf8, Units({'a', 0xFFFD, 'z'})}};
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (auto const& [text, encoding, units] : rows) {
        std::string const bytes = Form(Atom("expr", text));
        CKF_File file;
        ASSERT_EQ(0, file.Open(Span(bytes)));
        char** handle = nullptr;
        ASSERT_EQ(0, CKF_ReadHandle(&file, nullptr, CKF_Id("expr"), &handle));
        EXPECT_EQ(std::strlen(text), Q_GetHandleSize(handle));
        EXPECT_EQ(units, CKF_ConvertHandleToStringAndDisposeIfEncoded(&handle, &encoding)) << text;
        EXPECT_EQ(nullptr, handle);
        char** const plain = CKF_NewHandleFromString(units, false);
        EXPECT_EQ(PlainUtf8(units), std::string(*plain, Q_GetHandleSize(plain))) << "no mark where none is wanted";
        Q_FreeHandle(plain);
        for (CKF_TextEncoding const other : {CKF_TextEncoding_Utf8, CKF_TextEncoding_Latin1}) {
            handle = CKF_NewHandleFromString(units + Units({0xD800}), true);
            EXPECT_EQ(units + Units({0xD800}), CKF_ConvertHandleToStringAndDisposeIfEncoded(&handle, &other));
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    char** none = nullptr;
    EXPECT_TRUE(CKF_ConvertHandleToStringAndDisposeIfEncoded(&none, nullptr).empty());
}

TEST(ChunkFileVersions, EffectivePairs)
{
    int rows[][4] = {{55, 0, 55, 0}, {88, 2, 88, 2}, {88, 3, 88, 3}, {94, 9999, 94, 9999}, {95, 0, 95, 0},
                     {95, 1, 95, 0}, {96, 0, 95, 0}, {-1, 7, 0, 7},  {7, -1, 7, 0}};
    for (auto [major, minor, effectiveMajor, effectiveMinor] : rows) {
        CKF_GetEffectiveProjectVersion(&major, &minor);
        EXPECT_EQ(std::pair(effectiveMajor, effectiveMinor), std::pair(major, minor));
    }
    CKF_File file;
    for (int const major : {0, 56, 71, 72, 95, 200}) {
        file.majorVersion = major;
        EXPECT_EQ(major < 72, CKF_Version_Gen7_PreUnicode(&file)) << major;
    }
}

// ---- misuse

CKF_ChunkInfo firstList, secondList;

int BeginList(CKF_File* file, CKF_ChunkInfo* list = &firstList)
{
    return CKF_BeginChunkWrite(file, CKF_ListId, 0, CKF_Id("kfgp"), list);
}
int Find(CKF_File* file)
{
    return CKF_ReadAtom(file, CKF_Id("aaaa"), nullptr, 0, nullptr);
}
int ReadThree(CKF_File* file)
{
    CKF_ScDescend const first(file, 0, 0, nullptr, nullptr);
    int size = 3;
    char data[4];
    return CKF_ReadChunkData(file, &size, data);
}

// What fails a file that is written, or one with this content that is read, and where.
struct Misuse {
    char const* why;
    std::function<int(CKF_File*)> call;
    int code;
    std::string content;
    std::uint64_t offset = 0;
};

constexpr int Bad = CKF_Err_BadArgument, Unbalanced = CKF_Err_Unbalanced, Corrupt = CKF_Err_Corrupt;

Misuse const WhileWriting[] = {
    {"a list as atom", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_ListId, 0, nullptr); }, Bad},
    {"no id", [](CKF_File* f) { return CKF_WriteAtom(f, 0, 0, nullptr); }, Bad},
    {"the id of the file", [](CKF_File* f) { return CKF_WriteString(f, CKF_Id("KFSF"), {}, 0); }, Bad},
    {"a negative size", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("cdat"), -1, "x"); }, Bad},
    {"no data", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("cdat"), 1, nullptr); }, Bad},
    {"no handle", [](CKF_File* f) { return CKF_WriteHandle(f, CKF_Id("expr"), nullptr); }, Bad},
    {"no list", [](CKF_File* f) { return CKF_BeginChunkWrite(f, CKF_Id("cdat"), 0, 0, &firstList); }, Bad},
    {"no list type", [](CKF_File* f) { return CKF_BeginChunkWrite(f, CKF_ListId, 0, 0, &firstList); }, Bad},
    {"no items", [](CKF_File* f) { return SEQ_Write(nullptr, f); }, SEQ_Err_BadList},
    {"reading", [](CKF_File* f) { return CKF_ReadAtom(f, 1, nullptr, 0, nullptr); }, CKF_Err_NotOpen},
    {"an end without a beginning", [](CKF_File* f) { return CKF_EndChunkWrite(f, &(firstList = {})); }, Unbalanced},
    {"the outer list is closed first",
     [](CKF_File* f) { return BeginList(f) + BeginList(f, &secondList) + CKF_EndChunkWrite(f, &firstList); },
     Unbalanced},
    {"a list that is still open", [](CKF_File* f) { return BeginList(f) + f->Commit(); }, Unbalanced},
    {"lists beyond the depth that a reader takes",
     [](CKF_File* f) {
         for (int i = 0; i < CKF_MaxDepth; ++i) EXPECT_EQ(0, BeginList(f)) << i;
         return BeginList(f);
     },
     CKF_Err_TooDeep}};

std::string const AnAtom = Atom("aaaa", "12"), AList = List("kfgp", List("kfbs", ""));

Misuse const WhileReading[] = {
    {"more data than there is", ReadThree, CKF_Err_PastEnd, AnAtom, 40},
    {"data of a list", ReadThree, Bad, AList, 44},
    {"a list that isn't open",
     [](CKF_File* f) {
         CKF_ScDescend const list(f, 0, 0, nullptr, nullptr);
         CKF_ChunkInfo wrong = *list.GetChunkInfo();
         wrong.offset += 12;
         return CKF_ReadAtom(f, CKF_Id("aaaa"), &wrong, 0, nullptr);
     },
     Unbalanced, AList, 44},
    {"a list that isn't the innermost",
     [](CKF_File* f) {
         CKF_ScDescend const outer(f, 0, 0, nullptr, nullptr), inner(f, 0, 0, nullptr, nullptr);
         return CKF_ReadAtom(f, CKF_Id("aaaa"), outer.GetChunkInfo(), 0, nullptr);
     },
     Unbalanced, AList, 56},
    {"chunks in an atom",
     [](CKF_File* f) {
         CKF_ScDescend const atom(f, 0, 0, nullptr, nullptr);
         return Find(f);
     },
     Bad, Atom("bbbb", "12"), 40},
    {"a descent that is in use",
     [](CKF_File* f) {
         CKF_ScDescend list(f, 0, 0, nullptr, nullptr);
         return Thrown([&] { list.Descend(f, 0, 0, nullptr, nullptr); });
     },
     Unbalanced, AList, 44},
    {"no place", [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, 1, nullptr); }, Bad, AnAtom},
    {"a negative size", [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, -1, f); }, Bad, AnAtom},
    {"writing", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("aaaa"), 0, nullptr); }, CKF_Err_NotOpen},
    {"a length beyond the file", Find, Corrupt, "bbbb" + Long(3) + "ab", 32},
    {"a huge length", Find, Corrupt, "bbbb" + Long(0xFFFFFFFFu) + "ab", 32},
    {"half a header", Find, Corrupt, "bbbb" + Long(2) + "abhalf", 42},
    {"a list without room for its type", Find, Corrupt, "LIST" + Long(2) + "ab", 32}};

void ExpectItStays(Misuse const& row, bool isWriting)
{
    SCOPED_TRACE(row.why);
    std::string const bytes = Form(row.content);
    CKF_File file;
    ASSERT_EQ(0, isWriting ? file.CreateInMemory() : file.Open(Span(bytes)));
    EXPECT_EQ(row.code, row.call(&file));
    std::string const text = file.LastErrorText();
    EXPECT_NE("", text);
    u16str read;
    bool found = true;
    EXPECT_EQ(std::vector<int>(8, row.code),
              Codes(CKF_WriteAtom(&file, CKF_Id("cdat"), 2, "ok"), Find(&file),
                    Thrown([&] { CKF_WriteUTF16(&file, {}); }),
                    Thrown([&] { CKF_ScWriteList const list(&file, CKF_Id("kfgp"), 0); }),
                    Thrown([&] { CKF_ScDescend const any(&file, 0, 0, nullptr, &found); }),
                    Thrown([&] { CKF_ReadString(&file, nullptr, CKF_Id("kfsn"), &read, {}, 0); }), file.Commit(),
                    file.LastError()));
    EXPECT_FALSE(found);
    EXPECT_EQ(text, file.LastErrorText()) << "the first failure is the one that is told";
    EXPECT_TRUE(isWriting ? file.GetBytes().empty() : file.LastErrorOffset() == row.offset) << file.LastErrorOffset();
    EXPECT_EQ(0, isWriting ? file.CreateInMemory() + file.Commit() : file.Open(Span(bytes))) << "a new beginning";
}

TEST(ChunkFile, AFailureStays)
{
    for (Misuse const& row : WhileWriting) ExpectItStays(row, true);
    for (Misuse const& row : WhileReading) ExpectItStays(row, false);
    CKF_File file, other;
    EXPECT_EQ(0, file.LastError()) << "nothing is open in the beginning";
    EXPECT_EQ(CKF_Err_NotOpen, Find(&file));
    EXPECT_EQ(CKF_Err_NotOpen, other.Commit());
    EXPECT_EQ(std::vector<int>(3, Bad), Codes(CKF_WriteAtom(nullptr, CKF_Id("aaaa"), 0, nullptr),
                                              other.Open(static_cast<char const*>(nullptr)), other.Create(nullptr)));
}

}  // namespace
