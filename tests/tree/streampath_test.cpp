#include "tree/streampath.h"

#include "frame/boundary_private.h"
#include "frame/frame.h"
#include "frame/services/anyvalue.h"
#include "host/session.h"
#include "persist/longs_private.h"
#include "tests/support/chunklines.h"
#include "tests/support/reports.h"
#include "tests/support/text.h"

#include <random>

namespace {

KFS_MatchName Name(char const* text)
{
    return KFS_MatchName(text, true);
}

using ID = KFS_StreamID;

// A path of names, one a letter.
KFS_StreamIDPath Names(std::string const& letters)
{
    KFS_StreamIDPath path;
    for (char const letter : letters) path.AddTail(Name(std::string(1, letter).c_str()));
    return path;
}

// The letters of a path of names; '-' for one that isn't set.
std::string Letters(KFS_StreamIDPath const& path)
{
    std::string letters;
    for (KFS_StreamID const& id : path.GetPathConst()) {
        unsigned char const* const text = id.GetMatchName().GetName();
        letters += text && *text ? reinterpret_cast<char const*>(text) : "-";
    }
    return letters;
}

// Field by field, which operator== isn't.
bool Same(KFS_StreamIDPath const& a, KFS_StreamIDPath const& b)
{
    return std::equal(
        a.GetPathConst().begin(), a.GetPathConst().end(), b.GetPathConst().begin(), b.GetPathConst().end(),
        [](KFS_StreamID const& x, KFS_StreamID const& y) {
            return x.GetIndex() == y.GetIndex() && x.GetMatchName() == y.GetMatchName();
        });
}

std::string UidHex(KFS_StreamIDPath const& path)
{
    return MemoryFile::Hex(path.MakeUID().GuidToBytes());
}

class StreamPath : public testing::Test {
protected:
    kfshost::Session session_;
    ReportRecorder reports_;
};

TEST_F(StreamPath, GrowsAndShrinksAtBothEnds)
{
    KFS_StreamIDPath path = Names("b");
    path.AddTail(Name("c"));
    path.AddHead(Name("a"));
    path.AddTail(Names("de"));
    EXPECT_EQ("abcde", Letters(path));
    EXPECT_EQ("abcdef", Letters(KFS_StreamIDPath(path, Name("f"))));
    EXPECT_EQ("abcd", Letters(path.GetParentPath()));
    EXPECT_EQ(Name("e"), path.RemoveTail().GetMatchName());
    EXPECT_EQ(Name("a"), path.RemoveHead().GetMatchName());
    EXPECT_EQ("bcd", Letters(path));
    EXPECT_EQ(Name("b"), path.GetHead().GetMatchName());
    EXPECT_EQ(Name("d"), path.GetTail().GetMatchName());
    EXPECT_TRUE(path.IsEqualToTail(Name("d")));
    EXPECT_FALSE(path.IsEqualToTail(Name("c")));
    EXPECT_EQ("", Letters(Names("x").GetParentPath()));
    path.Clear();
    EXPECT_TRUE(path.IsEmpty());
    EXPECT_EQ(0u, path.GetPath().capacity());
    EXPECT_FALSE(path.IsEqualToTail(Name("d")));
    EXPECT_EQ("xyz", Letters(KFS_StreamIDPath(Name("x"), Name("y"), Name("z"))));
}

TEST_F(StreamPath, MayBeBuiltFromItself)
{
    KFS_StreamIDPath path = Names("ab");
    path.GetPath().shrink_to_fit();
    path.AddTail(path);
    EXPECT_EQ("abab", Letters(path));
    for (int i = 0; i < 5; ++i) {
        path.AddTail(path.GetHead());
        path.AddHead(path.GetTail());
    }
    EXPECT_EQ("aaaaaababaaaaa", Letters(path));
}

TEST_F(StreamPath, AskedForWhatIsNotThereReportsAndThrows3)
{
    const KFS_StreamIDPath empty, path = Names("ab");
    const std::function<void()> questions[] = {
        [&] { path.GetComponent(2); },
        [&] { path.GetComponent(0xFFFFFFFF); },
        [&] { empty.GetHead(); },
        [&] { empty.GetTail(); },
        [&] { path.HasTargetParent(Name("a"), 0); },
        [&] { empty.HasTargetParent(Name("a"), 0); },
    };
    for (auto const& ask : questions) {
        EXPECT_EQ(3, KFSp_Boundary(ask));
        std::vector<Reported> const seen = reports_.Take();
        ASSERT_EQ(1u, seen.size());
        EXPECT_EQ("asked for invalid component of property path", seen[0].text);
        EXPECT_EQ(8, seen[0].severity);
    }
}

TEST_F(StreamPath, ComparesComponentByComponent)
{
    const KFS_MatchName a = Name("a");
    using Path = KFS_StreamIDPath;
    EXPECT_EQ(Path(), Path());
    EXPECT_EQ(Names("ab"), Names("ab"));
    EXPECT_NE(Names("ab"), Names("a"));
    EXPECT_NE(Names("ab"), Names("ba"));
    EXPECT_EQ(Path(ID(1, a), ID(2, a)), Path(ID(1, Name("x")), ID(2, Name("y")))) << "indices decide";
    Path const nothing{KFS_StreamID()};
    EXPECT_NE(nothing, nothing);
    // Lexicographic, a prefix first.
    Path const ordered[] = {Path(), Path(1), Path(1, 1), Path(1, 2), Path(1, 2, 0), Path(2), Path(10)};
    for (std::size_t i = 0; i < std::size(ordered); ++i)
        for (std::size_t j = 0; j < std::size(ordered); ++j) EXPECT_EQ(i < j, ordered[i] < ordered[j]) << i << ' ' << j;
}

TEST_F(StreamPath, NamesAloneDecideWhereTheyAreAskedFor)
{
    using Path = KFS_StreamIDPath;
    const KFS_MatchName a = Name("a"), b = Name("b");
    Path const first(ID(1, a), ID(2, b)), otherIndices(ID(7, a), b);
    EXPECT_TRUE(first.IsEqualByMatchName(otherIndices));
    EXPECT_NE(first, Path(ID(7, a), ID(2, b)));
    EXPECT_FALSE(first.IsEqualByMatchName(Path(ID(1, a), ID(2, a))));
    EXPECT_FALSE(first.IsEqualByMatchName(Path(a)));
    EXPECT_TRUE(Path(3).IsEqualByMatchName(Path(4))) << "names that aren't set";
    EXPECT_TRUE(Path().IsEqualByMatchName(Path()));
}

TEST_F(StreamPath, APrefixIsStrict)
{
    struct Row {
        std::string first, second;
        bool prefix;
    };
    const Row rows[] = {{"", "", false},    {"", "a", true},    {"a", "a", false},   {"a", "ab", true},
                        {"b", "ab", false}, {"ab", "a", false}, {"ab", "abc", true}, {"ac", "abc", false}};
    for (Row const& row : rows)
        EXPECT_EQ(row.prefix, Names(row.first).IsPrefixOf(Names(row.second))) << row.first << ' ' << row.second;
    using Path = KFS_StreamIDPath;
    EXPECT_TRUE(Path(ID(3, Name("x"))).IsPrefixOf(Path(ID(3, Name("y")), 0))) << "by index where both have one";
    EXPECT_FALSE(Path(KFS_StreamID()).IsPrefixOf(Path(KFS_StreamID(), 0))) << "an empty identifier equals nothing";
}

TEST_F(StreamPath, FindsNamesFromBothEnds)
{
    const KFS_StreamIDPath path = Names("abcbd");
    unsigned int where = 77;
    EXPECT_TRUE(path.FindFirstInstanceOfMatchName(Name("b"), &where));
    EXPECT_EQ(1u, where);
    EXPECT_TRUE(path.FindFirstInstanceOfMatchName(Name("b"), nullptr));
    EXPECT_FALSE(path.FindFirstInstanceOfMatchName(Name("x"), &where));
    EXPECT_EQ(0xFFFFFFFFu, where);
    // Unset names are names here.
    EXPECT_TRUE(KFS_StreamIDPath(Name("a"), 3).FindFirstInstanceOfMatchName(KFS_MatchName(), &where));
    EXPECT_EQ(1u, where);
    EXPECT_EQ("abcb", Letters(KFS_FindFromReverse(Name("b"), path)));
    EXPECT_EQ("abcbd", Letters(KFS_FindFromReverse(Name("d"), path)));
    EXPECT_EQ("a", Letters(KFS_FindFromReverse(Name("a"), path)));
    EXPECT_TRUE(KFS_FindFromReverse(Name("x"), path).IsEmpty());
    EXPECT_TRUE(KFS_FindFromReverse(KFS_MatchName(), KFS_StreamIDPath(3)).IsEmpty()) << "an unset name is no name";
    EXPECT_EQ(9u, KFS_FindFromReverse(Name("a"), KFS_StreamIDPath(ID(9, Name("a")), 4)).GetHead().GetIndex());
    EXPECT_TRUE(path.HasTargetParent(Name("c"), 3));
    EXPECT_FALSE(path.HasTargetParent(Name("c"), 2));
    EXPECT_TRUE(path.HasTargetParent(Name("d"), 5));
    EXPECT_FALSE(path.HasTargetParent(Name("d"), 6)) << "a shorter path has no such level";
}

// MurmurHash3 x64 128, computed by another implementation from the bytes that make up an identity.
TEST_F(StreamPath, UidsAreTheSameEverywhere)
{
    using Path = KFS_StreamIDPath;
    EXPECT_EQ("18446fc522eee6326b8c4dfd5712ec7d", UidHex(Path()));
    EXPECT_EQ("1de6c0b3526a9f660d694e21f4a537a6", UidHex(Path(ID(2, Name("layer")))));
    EXPECT_EQ("74a4b1d4b243f6e04cdc24062ee36464", UidHex(Path(Name("layer"), ID(258, Name("opacity")))));
    EXPECT_EQ("0a4b4999b01be40cdeebb6d31e5bd58c", UidHex(Path(3)));
    EXPECT_EQ(Path(ID(1, Name("a"))), Path(ID(1, Name("b"))));
    EXPECT_NE(UidHex(Path(ID(1, Name("a")))), UidHex(Path(ID(1, Name("b"))))) << "both fields count";
}

TEST_F(StreamPath, JsonIsThisText)
{
    using Path = KFS_StreamIDPath;
    EXPECT_EQ(Text("{}"), Path().GetAs_JSON());
    EXPECT_EQ(Text(R"({"0":{"index":2,"matchName":"layer"}})"), Path(ID(2, Name("layer"))).GetAs_JSON());
    EXPECT_EQ(Text(R"({"0":{"index":4294967295,"matchName":"say \"hi\"\\"},"1":{"index":0,"matchName":""}})"),
              Path(Name("say \"hi\"\\"), 0).GetAs_JSON());
    Path ten;
    for (unsigned int i = 0; i < 10; ++i) ten.AddTail(i);
    std::string const text = Q_UTF16ToMBString(ten.GetAs_JSON());
    EXPECT_EQ(0u, text.find(R"({"00":{"index":0,)")) << text;
    EXPECT_NE(std::string::npos, text.find(R"("09":{"index":9,)")) << "keys of equal width";
}

TEST_F(StreamPath, JsonThatIsNoPathLeavesThePathAlone)
{
    std::string const good = R"({"0": {"index": 1, "matchName": "z"}, )";
    std::string const bad[] = {
        "",
        "7",
        "{",
        good,
        good + R"("1": {"index": 1}})",
        good + R"("1": {"matchName": "x"}})",
        good + R"("1": {"index": "one", "matchName": "x"}})",
        good + R"("1": {"index": -1, "matchName": "x"}})",
        good + R"("1": {"index": 4294967296, "matchName": "x"}})",
        good + R"("1": 3})",
        std::string(100000, '['),
        std::string(100000, '{'),
    };
    for (std::string const& text : bad) {
        SCOPED_TRACE(text.substr(0, 80));
        KFS_StreamIDPath path = Names("ab");
        EXPECT_NE(0, KFSp_Boundary([&] { path.SetFrom_JSON(Text(text)); }));
        EXPECT_EQ("ab", Letters(path));
        EXPECT_NO_REPORT(reports_);
    }
    // The index is read first, so that a component that is refused for it leaves no name behind.
    KFS_StreamIDPath path;
    EXPECT_EQ(Q_Err_NotANumber, KFSp_Boundary([&] { path.SetFrom_JSON(Text(R"({"0": {"index": "one"}})")); }));
}

TEST_F(StreamPath, ChunksAreTheseBytes)
{
    const MemoryFile file([](CKF_File* out) { KFS_StreamIDPath(ID(2, Name("b")), Name("c")).Write(out); });
    std::string const zeros(78, '0');
    EXPECT_EQ((std::vector<std::string>{"LIST kfsp", "  kfot ffffffff", "  kfpl 00000002",          //
                                        "  LIST kfsi", "    kfix 00000002", "    kfmn 62" + zeros,  //
                                        "  LIST kfsi", "    kfix ffffffff", "    kfmn 63" + zeros}),
              file.Lines());
    file.Read([](CKF_File* in) {
        KFS_StreamIDPath path = Names("gone");
        path.Read(in, nullptr);
        EXPECT_TRUE(Same(KFS_StreamIDPath(ID(2, Name("b")), Name("c")), path));
        EXPECT_FALSE(path.IsSentinel());
    });
}

TEST_F(StreamPath, ARunOfPathsEndsWithTheSentinel)
{
    MemoryFile const file([](CKF_File* out) {
        KFS_StreamIDPath().Write(out);
        Names("abc").Write(out);
        KFS_StreamIDPath::WriteSentinel(out);
    });
    std::string sentinel = "ZQVM End of path sentinel";
    sentinel.resize(40, '\0');
    std::string const atom =
        MemoryFile::Hex({reinterpret_cast<unsigned char const*>(sentinel.data()), sentinel.size()});
    EXPECT_EQ("    kfmn " + atom, file.Lines().back());
    file.Read([](CKF_File* in) {
        std::vector<std::string> read;
        for (KFS_StreamIDPath path;;) {
            path.Read(in, nullptr);
            if (path.IsSentinel()) break;
            read.push_back(Letters(path));
        }
        EXPECT_EQ((std::vector<std::string>{"", "abc"}), read);
    });
    const KFS_MatchName name = Name("ZQVM End of path sentinel");
    EXPECT_TRUE(KFS_StreamIDPath(ID(7, name)).IsSentinel()) << "whatever its index";
    EXPECT_FALSE(KFS_StreamIDPath(name, name).IsSentinel());
    EXPECT_FALSE(KFS_StreamIDPath().IsSentinel());
}

int S_fixedUpType = -1;
std::string S_fixedUpPath;

void FixUp(int oldType, KFS_StreamIDPath* path)
{
    S_fixedUpType = oldType;
    S_fixedUpPath = Letters(*path);
    *path = Names("fixed");
}

MemoryFile FileWithHead(int oldType, int length, std::string const& names)
{
    KFS_StreamIDPath const path = Names(names);
    return MemoryFile([&](CKF_File* out) {
        const CKF_ScWriteList list(out, CKF_Id("kfsp"), 0);
        KFSp_WriteLong(out, CKF_Id("kfot"), oldType);
        KFSp_WriteLong(out, CKF_Id("kfpl"), length);
        for (KFS_StreamID const& id : path.GetPathConst()) id.Write(out);
    });
}

TEST_F(StreamPath, AnOldTypeNumberGoesToTheApplication)
{
    for (int const oldType : {-1, -2, 0, 12}) {
        for (bool const hasCallback : {true, false}) {
            SCOPED_TRACE(testing::Message() << oldType << ' ' << hasCallback);
            bool const asked = oldType >= 0 && hasCallback;
            KFS_AppCallbacks callbacks;
            callbacks.oldPathFixupFunc = hasCallback ? FixUp : nullptr;
            KFS_SetCallbacks(callbacks);
            S_fixedUpType = -1;
            S_fixedUpPath.clear();
            KFS_StreamIDPath path;
            FileWithHead(oldType, 2, "ab").Read([&](CKF_File* in) { path.Read(in, nullptr); });
            EXPECT_EQ(asked ? "fixed" : "ab", Letters(path));
            EXPECT_EQ(asked ? oldType : -1, S_fixedUpType);
            EXPECT_EQ(asked ? "ab" : "", S_fixedUpPath) << "the stored components were read before";
            KFS_ClearCallbacks();
        }
    }
}

TEST_F(StreamPath, ALengthIsOnlyAClaim)
{
    for (int const length : {3, 1000, INT_MAX}) {
        KFS_StreamIDPath path;
        FileWithHead(-1, length, "ab").Read([&](CKF_File* in) {
            EXPECT_EQ(CKF_Err_NoSuchChunk, KFSp_Boundary([&] { path.Read(in, nullptr); }));
        });
        EXPECT_EQ("ab", Letters(path)) << "what was read stays";
        EXPECT_LT(path.GetPath().capacity(), 10u);
    }
    for (int const length : {0, -1, INT_MIN}) {
        KFS_StreamIDPath path = Names("x");
        FileWithHead(-1, length, "ab").Read([&](CKF_File* in) { path.Read(in, nullptr); });
        EXPECT_TRUE(path.IsEmpty());
    }
}

}  // namespace
