// Files that nobody wrote: cut short, bent, lying and endless.
#include "tests/services/chunkbytes.h"
#include "tests/support/dice.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <algorithm>
#include <tuple>
#include <vector>

namespace {

// Reads in the manner of the library: by ids, in fixed order, giving up at the first failure. Returns its code.
int ReadAsATree(CKF_File* file, CKF_ChunkInfo const* parent)
{
    return Thrown([&] {
        bool found = false;
        const CKF_ScDescendList group(file, CKF_Id("kfgp"), parent, &found);
        if (!found) return;
        for (int i = 0; i < 1000; ++i) {
            char name[40];
            if (CKF_ReadAtom(file, CKF_Id("kfmn"), group.GetChunkInfo(), sizeof name, name) != 0) return;
            const CKF_ScDescendList leaf(file, CKF_Id("kfbs"), group.GetChunkInfo(), &found);
            if (!found) continue;
            u16str text;
            CKF_ReadString(file, leaf.GetChunkInfo(), CKF_Id("kfsn"), &text, {}, 0);
            char** handle = nullptr;
            if (CKF_ReadHandle(file, leaf.GetChunkInfo(), CKF_Id("kfb4"), &handle) == 0) Q_FreeHandle(handle);
            SEQ_Head** list = nullptr;
            if (SEQ_Read(file, &list) == 0) EXPECT_EQ(0, SEQ_Dispose(list, 0));
            CKF_ReadUTF16(file, &text, leaf.GetChunkInfo());
        }
    });
}

// Opens and reads these bytes in every way there is. Whatever the bytes are, this must end, and leave nothing.
void TakeEverything(std::string const& bytes)
{
    CKF_File file;
    int const opened = file.Open(Span(bytes));
    EXPECT_EQ(opened, file.LastError());
    std::string outline;
    int const outlined = Thrown([&] { outline = Outline(&file); });
    EXPECT_LE(outline.size(), 4 * bytes.size() + 16);
    if (file.Open(Span(bytes)) == 0) ReadAsATree(&file, nullptr);

    CKF_ChunkWalk walk(Span(bytes));
    CKF_RawChunk chunk{};
    std::size_t count = 0;
    while (walk.Next(&chunk)) {
        ASSERT_LE(++count, bytes.size()) << "the walk goes in a circle";
        ASSERT_LE(chunk.offset, bytes.size());
        if (chunk.data.empty()) continue;
        ASSERT_GE(chunk.data.data(), Span(bytes).data());
        ASSERT_LE(chunk.data.data() + chunk.data.size(), Span(bytes).data() + bytes.size());
    }
    EXPECT_TRUE(opened != 0 || (outlined == 0) == walk.Sound())
        << "the walk sees a problem where a reader fails, and only there";
}

TEST(ChunkFileHostile, CutBentAndRandomBytesAreSurvived)
{
    std::string const sample = NestedSample();
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    TakeEverything(sample);
    for (std::size_t size = 0; size <= sample.size() + 1; ++size) {
        if (size == sample.size()) continue;
        // A block of its own size, so that the sanitizer sees a read behind it.
        std::string const cut = size < sample.size() ? std::string(sample.data(), size) : sample + '\0';
        CKF_File file;
        int const code = file.Open(Span(cut));
        EXPECT_TRUE(code == CKF_Err_Corrupt || code == CKF_Err_NotAChunkFile) << size << " gives " << code;
        EXPECT_TRUE(size < sample.size() || file.LastErrorOffset() == sample.size());
        TakeEverything(cut);
    }
    for (std::size_t at = 0; at < sample.size(); ++at)
        for (int const mask : {0x01, 0x80, 0xFF}) {
            std::string bent = sample;
            bent[at] = static_cast<char>(bent[at] ^ mask);
            SCOPED_TRACE(testing::Message() << "byte " << at << " mask " << mask);
            TakeEverything(bent);
        }
    Dice dice(20);
    char const* const words[] = {
        "LIST", "kfgp", "kfbs", "KFSF", "kfmn", "seql", "Utf8", "\0\0\0\0", "\xFF\xFF\xFF\xFF", "\x7F\xFF\xFF\xFF"};
    for (int round = 0; round < Rounds(1500); ++round) {
        std::string bytes = sample;
        for (int i = dice.Below(6); i >= 0; --i)
            bytes.replace(8 + static_cast<std::size_t>(dice.Below(static_cast<int>(bytes.size()) - 16)), 4,
                          round % 2 ? std::string(words[dice.Below(10)], 4)
                                    : Long(static_cast<std::uint32_t>(dice.Below(64))));
        TakeEverything(bytes);
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(ChunkFileHostile, ListsNestAsDeepAsTheWriterCanAndNoDeeper)
{
    CKF_File file;
    // The last are a hundred thousand lists in each other: no recursion may follow them.
    for (std::uint32_t const lists : {CKF_MaxDepth, CKF_MaxDepth + 1, 100000}) {
        std::string nested;
        for (std::uint32_t i = 0; i < lists; ++i) nested += "LIST" + Long(12 * (lists - i) - 8) + "kfgp";
        std::string const bytes = Form(nested);
        ASSERT_EQ(0, file.Open(Span(bytes)));
        EXPECT_EQ(lists > CKF_MaxDepth ? CKF_Err_TooDeep : 0, Thrown([&] { Outline(&file); }));
        CKF_ChunkWalk walk{Span(bytes)};
        CKF_RawChunk chunk{};
        int deepest = 0;
        while (walk.Next(&chunk)) deepest = std::max(deepest, chunk.depth);
        EXPECT_EQ(std::min(static_cast<int>(lists), CKF_MaxDepth + 1), deepest);
        EXPECT_EQ(lists == CKF_MaxDepth, walk.Sound());
    }
}

// Each name makes a reader look for a group and a leaf that never come. Looking through the rest each time would make
// the cost of a file grow with the square of its size. The last chunk tells: it is damaged while nobody has a reason to
// look at it, and whoever looks all the same fails.
TEST(ChunkFileHostile, ASearchThatFoundNothingIsNotMadeAgain)
{
    constexpr int names = 20;
    std::string content;
    for (int i = 0; i < names; ++i) content += Atom("kfmn", "name");
    std::string bytes = Form(List("kfgp", content));
    CKF_File file;
    ASSERT_EQ(0, file.Open(Span(bytes)));
    const CKF_ScDescendList group(&file, CKF_Id("kfgp"), nullptr, nullptr);
    auto const readName = [&] { return CKF_ReadAtom(&file, CKF_Id("kfmn"), group.GetChunkInfo(), 0, nullptr); };
    auto const isThere = [&](int id, int listType) {
        bool found = true;
        CKF_ScDescend const descent(&file, id, listType, group.GetChunkInfo(), &found);
        return found;
    };
    auto const lookForChildren = [&] {
        EXPECT_FALSE(isThere(CKF_ListId, CKF_Id("kfgp")) || isThere(CKF_ListId, CKF_Id("kfbs")));
        EXPECT_FALSE(isThere(CKF_Id("seql"), 0) || isThere(CKF_Id("kfsn"), 0));
    };
    std::size_t const last = bytes.size() - 12;
    for (int i = 0; i < names - 1; ++i) {
        ASSERT_EQ(0, readName());
        lookForChildren();
        bytes.replace(last + 4, 4, Long(0xFFFFFFFF));
    }
    EXPECT_EQ(0, file.LastError());
    EXPECT_EQ(CKF_Err_Corrupt, readName()) << "the one that has a reason";
    EXPECT_EQ(last, file.LastErrorOffset());
}

TEST(ChunkFileHostile, AClaimCostsNoMemory)
{
    // Everything here claims two thousand million bytes or items and has eight.
    std::vector<std::string> lies = {Form("expr" + Long(0x7FFFFFFE) + "12345678"), Form(Atom("seql", "1234"))};
    constexpr std::uint32_t claims[][2] = {{1, 0x7FFFFFFF}, {0x7FFF, 0x7FFFFFFF}, {0xFFFFFFFF, 2}, {8, 0xFFFFFFFF},
                                           {4, 1},          {4, 0x40000002},      {0, 0},          {0x8000, 0},
                                           {0x10001, 0}};
    for (auto const& [itemSize, count] : claims)
        lies.push_back(Form(Atom("seql", Long(itemSize) + Long(count) + (count ? "12345678" : ""))));
    for (std::string const& lie : lies) {
        CKF_File file;
        ASSERT_EQ(0, file.Open(Span(lie)));
        Q_FailAllocation(1);
        char** handle = nullptr;
        SEQ_Head** made = nullptr;
        int const code = lie.find("expr") != std::string::npos ? CKF_ReadHandle(&file, nullptr, CKF_Id("expr"), &handle)
                                                               : SEQ_Read(&file, &made);
        bool const fired = Q_FailAllocationFired();
        Q_FailAllocation(0);
        EXPECT_FALSE(fired) << "checked before anything is allocated";
        EXPECT_TRUE(code == CKF_Err_Corrupt || code == SEQ_Err_BadChunk) << code;
        EXPECT_EQ(code, file.LastError());
        EXPECT_EQ(nullptr, handle);
        EXPECT_EQ(nullptr, made);
    }
}

TEST(ChunkFileHostile, OpeningIsExactAboutTheOuterForm)
{
    const std::string good = Form("");
    auto const with = [&](std::size_t at, std::string const& bytes) {
        return std::string(good).replace(at, bytes.size(), bytes);
    };
    std::tuple<std::string, int> const rows[] = {
        {"", CKF_Err_NotAChunkFile},
        {"RIFF\0\0\0\4WAVE----------------", CKF_Err_NotAChunkFile},
        {with(8, "song"), CKF_Err_NotAChunkFile},
        {with(12, "vors"), CKF_Err_NotAChunkFile},
        {with(4, Long(22)).replace(16, 4, Long(8)).substr(0, 30), CKF_Err_NotAChunkFile},  // without an encoding
        {"KFSF" + Long(4) + "proj", CKF_Err_NotAChunkFile},
        {with(4, Long(26)), CKF_Err_Corrupt},
        {with(4, Long(22)), CKF_Err_Corrupt}};
    for (auto const& [bytes, code] : rows) {
        CKF_File file;
        EXPECT_EQ(code, file.Open(Span(bytes))) << bytes;
        EXPECT_STRNE("", file.LastErrorText()) << bytes;
        EXPECT_TRUE(file.GetBytes().empty()) << bytes;
    }
    CKF_File file;
    for (std::string const& inside : {Form(Form("")), Form(List("kfgp", Form("")))}) {
        ASSERT_EQ(0, file.Open(Span(inside)));
        EXPECT_EQ(CKF_Err_Corrupt, Thrown([&] { Outline(&file); })) << "a file inside a file";
    }
    // What a later build may add to the version record is stepped over.
    std::string const longer =
        "KFSF" + Long(4 + 24 + 10) + "proj" + Atom("vers", Long(95) + Long(0) + Long(0) + "more") + Atom("aaaa", "12");
    ASSERT_EQ(0, file.Open(Span(longer)));
    EXPECT_EQ("aaaa:2", Outline(&file));
}

// ---- the walk

std::string Walked(std::string const& bytes)
{
    std::string text;
    CKF_ChunkWalk walk(Span(bytes));
    CKF_RawChunk chunk{};
    while (walk.Next(&chunk)) {
        text += std::string(static_cast<std::size_t>(chunk.depth), ' ') +
                (chunk.id ? Long(static_cast<std::uint32_t>(chunk.id)) : "????") + "@" + std::to_string(chunk.offset) +
                " " + std::to_string(chunk.data.size()) + "/" + std::to_string(chunk.claimedSize);
        if (chunk.listType != 0) text += " " + Long(static_cast<std::uint32_t>(chunk.listType));
        if (chunk.problem) text += std::string(": ") + chunk.problem;
        text += '\n';
    }
    return text;
}

TEST(ChunkFileWalk, GoesOnBehindWhatIsBroken)
{
    // The inner list claims more than the outer one has; what stands behind the outer one is still found.
    const std::string liar = "LIST" + Long(400) + "kfbs" + Atom("in__", "12");
    EXPECT_EQ("KFSF@0 66/66 proj\n"
              " vers@12 12/12\n"
              " LIST@32 22/22 kfgp\n"
              "  LIST@44 10/396 kfbs: longer than what contains it\n"
              "   in__@56 2/2\n"
              " next@66 4/4\n",
              Walked(Form(List("kfgp", liar) + Atom("next", "1234"))));
    // A file that was cut short shows what is left of it.
    EXPECT_EQ("KFSF@0 40/54 proj: longer than what contains it\n"
              " vers@12 12/12\n"
              " LIST@32 8/12 kfgp: longer than what contains it\n"
              "  next@44 0/4: longer than what contains it\n",
              Walked(Form(List("kfgp", Atom("next", "1234")) + Atom("lost", "12")).substr(0, 52)));
    EXPECT_EQ("KFSF@0 4/20 proj: longer than what contains it\n"
              " ????@12 4/0: too short for the header of a chunk\n",
              Walked(Form("").substr(0, 16)));
    EXPECT_EQ("KFSF@0 20/20 proj\n"
              " vers@12 12/12\n"
              "????@32 4/0: behind the end of the outer form\n",
              Walked(Form("") + "tail"));
    EXPECT_EQ("KFSF@0 52/52 proj\n"
              " vers@12 12/12\n"
              " KFSF@32 20/20 proj: an outer form inside the file\n",
              Walked(Form(Form(""))));
    EXPECT_EQ("what@0 0/1702258034: not the outer form of a project file\n", Walked("whatever"));
    EXPECT_EQ("", Walked(""));
}

}  // namespace
