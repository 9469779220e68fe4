// Searches, descents and what they leave behind.
#include "tests/services/chunkbytes.h"

#include <functional>
#include <memory>
#include <vector>

namespace {

// A file of these bytes, open.
struct OpenFile {
    explicit OpenFile(std::string content) : bytes(std::move(content))
    {
        EXPECT_EQ(0, file.Open(Span(bytes))) << file.LastErrorText();
    }
    operator CKF_File*() { return &file; }

    std::string bytes;
    CKF_File file;
};

std::string ReadAtom(CKF_File* file, int id, CKF_ChunkInfo const* parent = nullptr)
{
    char data[8] = {};
    int const code = CKF_ReadAtom(file, id, parent, sizeof data, data);
    return code == 0 ? std::string(data) : "code " + std::to_string(code);
}
const std::string None = "code " + std::to_string(CKF_Err_NoSuchChunk);

TEST(ChunkFileReading, StepsOverWhatItDoesNotLookFor)
{
    OpenFile file(Form(Atom("aaaa", "1") + Atom("what", "odd") + List("kfgp", Atom("bbbb", "hidden")) +
                       Atom("bbbb", "2") + Atom("cccc", "3")));
    EXPECT_EQ("1", ReadAtom(file, CKF_Id("aaaa")));
    EXPECT_EQ("2", ReadAtom(file, CKF_Id("bbbb"))) << "neither the unknown atom nor the one in the list";
    EXPECT_EQ(None, ReadAtom(file, CKF_Id("aaaa"))) << "never backwards";
    EXPECT_EQ("3", ReadAtom(file, CKF_Id("cccc"))) << "a search that found nothing left the position";
    EXPECT_EQ(0, file.file.LastError()) << "a chunk that isn't there is an answer";
}

TEST(ChunkFileReading, CopiesNoMoreThanTheAtomAndNoMoreThanAsked)
{
    const struct {
        std::string data;
        int size;
        std::string buffer;
    } rows[] = {
        {"12345678", 24, "12345678........................"}, {"12345678", 4, "1234............................"},
        {"", 4, "................................"},          {"123", 3, "123............................."},
        {"123", 0, "................................"},
    };
    for (auto const& row : rows) {
        OpenFile file(Form(Atom("kfsi", row.data) + Atom("next", "n")));
        std::string buffer(32, '.');
        ASSERT_EQ(0, CKF_ReadAtom(file, CKF_Id("kfsi"), nullptr, row.size, buffer.data()));
        EXPECT_EQ(row.buffer, buffer);
        bool found = false;
        CKF_ScDescend const next(file, 0, 0, nullptr, &found);
        EXPECT_EQ(CKF_Id("next"), next.GetChunkInfo()->id) << "the position is behind the whole atom";
    }
}

TEST(ChunkFileReading, AStringThatIsNotThereIsTheFallback)
{
    OpenFile file(Form(List("kfbs", Atom("kfb4", "b")) + Atom("kfsn", "outside")));
    const CKF_ScDescendList list(file, CKF_Id("kfbs"), nullptr, nullptr);
    u16str name = Text("old");
    EXPECT_FALSE(CKF_ReadString(file, list.GetChunkInfo(), CKF_Id("kfsn"), &name, Text("fallback"), 0));
    EXPECT_EQ(Text("fallback"), name);
    EXPECT_EQ("b", ReadAtom(file, CKF_Id("kfb4"), list.GetChunkInfo()));
    EXPECT_EQ(CKF_Err_NoSuchChunk, Thrown([&] { CKF_ReadUTF16(file, &name, list.GetChunkInfo()); }));
}

TEST(ChunkFileReading, DescentsAskForIdAndListType)
{
    const std::string content = Atom("kfbs", "atom") + List("kfgp", "") + List("kfbs", Atom("in__", "1"));
    const struct {
        char const* why;
        int id, listType;
        int enteredId, enteredType;  // 0: nothing
    } rows[] = {
        {"a list of a type", CKF_ListId, CKF_Id("kfbs"), CKF_ListId, CKF_Id("kfbs")},
        {"any list", CKF_ListId, 0, CKF_ListId, CKF_Id("kfgp")},
        {"an atom by its id", CKF_Id("kfbs"), 0, CKF_Id("kfbs"), 0},
        {"whatever comes", 0, 0, CKF_Id("kfbs"), 0},
        {"anything of a list type", 0, CKF_Id("kfgp"), CKF_ListId, CKF_Id("kfgp")},
        {"a list that isn't there", CKF_ListId, CKF_Id("kfsp"), 0, 0},
        {"an atom has no list type", CKF_Id("kfbs"), CKF_Id("kfbs"), 0, 0},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.why);
        OpenFile file(Form(content));
        CKF_ScDescend descent;
        EXPECT_EQ(row.enteredId != 0 ? 0 : CKF_Err_NoSuchChunk,
                  Thrown([&] { descent.Descend(file, row.id, row.listType, nullptr, nullptr); }));
        EXPECT_EQ(row.enteredId, descent.GetChunkInfo()->id);
        EXPECT_EQ(row.enteredType, descent.GetChunkInfo()->listType);
        bool found = row.enteredId == 0;
        OpenFile again(Form(content));
        CKF_ScDescend const asked(again, row.id, row.listType, nullptr, &found);
        EXPECT_EQ(row.enteredId != 0, found);
    }
}

TEST(ChunkFileReading, ADescentLeftEarlyIsBehindItsChunk)
{
    std::string const content =
        List("kfgp", Atom("aaaa", "1") + List("kfbs", Atom("bbbb", "222") + Atom("cccc", "3")) + Atom("dddd", "4")) +
        Atom("eeee", "5");
    // How far the reader goes into the inner list before it gives up.
    for (int steps = 0; steps < 4; ++steps) {
        SCOPED_TRACE(steps);
        OpenFile file(Form(content));
        {
            const CKF_ScDescendList outer(file, CKF_Id("kfgp"), nullptr, nullptr);
            EXPECT_EQ(99, Thrown([&] {
                          const CKF_ScDescendList inner(file, CKF_Id("kfbs"), outer.GetChunkInfo(), nullptr);
                          if (steps == 0) throw 99;
                          const CKF_ScDescend atom(file, CKF_Id("bbbb"), 0, inner.GetChunkInfo(), nullptr);
                          if (steps == 1) throw 99;
                          int size = steps;
                          char data[4];
                          EXPECT_EQ(0, CKF_ReadChunkData(file, &size, data));
                          throw 99;
                      }));
            EXPECT_EQ("4", ReadAtom(file, CKF_Id("dddd"), outer.GetChunkInfo()));
        }
        EXPECT_EQ("5", ReadAtom(file, CKF_Id("eeee")));
        EXPECT_EQ(0, file.file.LastError());
    }
}

TEST(ChunkFileReading, DataOfAnAtomComesInPieces)
{
    OpenFile file(Form(Atom("kfb4", "abcde") + Atom("next", "n")));
    {
        CKF_ScDescend const atom(file, 0, 0, nullptr, nullptr);
        EXPECT_EQ(5u, atom.GetChunkInfo()->size);
        std::string data(5, '.');
        int size = 2;
        EXPECT_EQ(0, CKF_ReadChunkData(file, &size, data.data()));
        size = 3;
        EXPECT_EQ(0, CKF_ReadChunkData(file, &size, data.data() + 2));
        EXPECT_EQ("abcde", data);
        size = 0;
        EXPECT_EQ(0, CKF_ReadChunkData(file, &size, nullptr));
    }
    EXPECT_EQ("n", ReadAtom(file, CKF_Id("next")));
}

// Failures: each is told, and stays.
struct Failure {
    char const* why;
    std::string content;
    std::function<int(CKF_File*)> call;
    int code;
    std::uint64_t offset;
};

TEST(ChunkFileReading, AFailureStays)
{
    auto const readPast = [](CKF_File* f) {
        CKF_ScDescend const atom(f, 0, 0, nullptr, nullptr);
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
    auto const readInList = [](CKF_File* f) {
        CKF_ScDescend const list(f, 0, 0, nullptr, nullptr);
        int size = 0;
        return CKF_ReadChunkData(f, &size, nullptr);
    };
    auto const useTwice = [](CKF_File* f) {
        CKF_ScDescend list(f, 0, 0, nullptr, nullptr);
        return Thrown([&] { list.Descend(f, 0, 0, nullptr, nullptr); });
    };
    auto const find = [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, 0, nullptr); };
    const std::string list = List("kfgp", List("kfbs", ""));
    Failure const rows[] = {
        {"more data than there is", Atom("aaaa", "12"), readPast, CKF_Err_PastEnd, 40},
        {"a list that isn't open", list, searchOutside, CKF_Err_Unbalanced, 44},
        {"a list that isn't the innermost", list, searchOuter, CKF_Err_Unbalanced, 56},
        {"chunks in an atom", Atom("bbbb", "12"), searchInAtom, CKF_Err_BadArgument, 40},
        {"data of a list", list, readInList, CKF_Err_BadArgument, 44},
        {"a descent that is in use", list, useTwice, CKF_Err_Unbalanced, 44},
        {"an atom without a place", Atom("aaaa", "12"),
         [](CKF_File* f) { return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, 1, nullptr); }, CKF_Err_BadArgument, 0},
        {"a negative size", Atom("aaaa", "12"),
         [](CKF_File* f) {
             char c;
             return CKF_ReadAtom(f, CKF_Id("aaaa"), nullptr, -1, &c);
         },
         CKF_Err_BadArgument, 0},
        {"writing", "", [](CKF_File* f) { return CKF_WriteAtom(f, CKF_Id("aaaa"), 0, nullptr); }, CKF_Err_NotOpen, 0},
        {"a length beyond the file", "bbbb" + Long(3) + "ab", find, CKF_Err_Corrupt, 32},
        {"a huge length", "bbbb" + Long(0xFFFFFFFFu) + "ab", find, CKF_Err_Corrupt, 32},
        {"half a header", "bbbb" + Long(2) + "abhalf", find, CKF_Err_Corrupt, 42},
        {"a list without room for its type", "LIST" + Long(2) + "ab", find, CKF_Err_Corrupt, 32},
    };
    for (Failure const& row : rows) {
        SCOPED_TRACE(row.why);
        OpenFile file(Form(row.content));
        EXPECT_EQ(row.code, row.call(file));
        EXPECT_EQ(row.code, file.file.LastError());
        EXPECT_EQ(row.offset, file.file.LastErrorOffset());
        EXPECT_STRNE("", file.file.LastErrorText());
        EXPECT_EQ(row.code, find(file));
        bool found = true;
        EXPECT_EQ(row.code, Thrown([&] { CKF_ScDescend const any(file, 0, 0, nullptr, &found); }));
        EXPECT_FALSE(found);
        u16str text;
        EXPECT_EQ(row.code, Thrown([&] { CKF_ReadString(file, nullptr, CKF_Id("kfsn"), &text, {}, 0); }));
        EXPECT_EQ(0, file.file.Open(Span(file.bytes))) << "opened again it is as good as before";
    }
}

TEST(ChunkFileReading, NothingIsOpenInTheBeginning)
{
    CKF_File file;
    EXPECT_EQ(0, file.LastError());
    EXPECT_EQ(CKF_Err_NotOpen, CKF_ReadAtom(&file, CKF_Id("aaaa"), nullptr, 0, nullptr));
    CKF_File other;
    EXPECT_EQ(CKF_Err_NotOpen, other.Commit());
    EXPECT_EQ(CKF_Err_BadArgument, CKF_WriteAtom(nullptr, CKF_Id("aaaa"), 0, nullptr));
    EXPECT_EQ(CKF_Err_BadArgument, other.Open(static_cast<char const*>(nullptr)));
    EXPECT_EQ(CKF_Err_BadArgument, other.Create(nullptr));
}

}  // namespace
