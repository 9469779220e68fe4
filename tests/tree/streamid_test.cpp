#include "tree/streamid.h"

#include "frame/boundary_private.h"
#include "persist/longs_private.h"
#include "tests/support/chunklines.h"
#include "tests/support/reports.h"

#include <climits>

namespace {

KFS_MatchName Name(char const* text)
{
    return KFS_MatchName(text, true);
}

// The bytes of a match name's atom.
std::string AtomHex(std::string text)
{
    text.resize(40, '\0');
    return MemoryFile::Hex({reinterpret_cast<unsigned char const*>(text.data()), text.size()});
}

TEST(StreamID, EqualityGoesByIndexThenByName)
{
    const KFS_MatchName a = Name("a"), b = Name("b");
    struct Row {
        char const* why;
        KFS_StreamID first, second;
        bool equal;
    };
    Row const rows[] = {
        {"nothing in common with itself", {}, {}, false},
        {"indices", {3}, {3}, true},
        {"other indices", {3}, {4}, false},
        {"index 0 is an index", {0}, {0}, true},
        {"an index decides, one name", {3}, {3, a}, true},
        {"an index decides, both names", {3, a}, {3, b}, true},
        {"other indices, the same name", {3, a}, {4, a}, false},
        {"names, one index", {a}, {7, a}, true},
        {"names, no index", {a}, {a}, true},
        {"other names, one index", {3, a}, {b}, false},
        {"no index against a name alone", {3}, {a}, false},
        {"no common field", {3}, {}, false},
        {"a name against nothing", {a}, {}, false},
        {"no index is no index", {KFS_StreamID::NoIndex}, {KFS_StreamID::NoIndex}, false},
        {"no index leaves it to the names", {KFS_StreamID::NoIndex, a}, {2, a}, true},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        EXPECT_EQ(row.equal, row.first == row.second);
        EXPECT_EQ(row.equal, row.second == row.first);
        EXPECT_EQ(!row.equal, row.first != row.second);
    }
}

TEST(StreamID, OrderGoesByIndexThenByHash)
{
    bool const aFirst = Name("a") < Name("b");
    const KFS_MatchName low = Name(aFirst ? "a" : "b"), high = Name(aFirst ? "b" : "a");
    struct Row {
        char const* why;
        KFS_StreamID first, second;
        bool less, greater;
    };
    Row const rows[] = {
        {"indices", {3}, {4}, true, false},
        {"indices as unsigned numbers", {1}, {0xFFFFFFFE}, true, false},
        {"indices before names", {3, high}, {4, low}, true, false},
        {"equal indices", {3, low}, {3, high}, false, false},
        {"names", {low}, {high}, true, false},
        {"names, one index", {9, low}, {high}, true, false},
        {"nothing in common", {3}, {low}, false, false},
        {"nothing at all", {}, {}, false, false},
    };
    for (Row const& row : rows) {
        SCOPED_TRACE(row.why);
        EXPECT_EQ(row.less, row.first < row.second);
        EXPECT_EQ(row.greater, row.second < row.first);
    }
}

TEST(StreamID, ChunksAreTheseBytes)
{
    MemoryFile const file([](CKF_File* out) {
        KFS_StreamID(0x01020304, Name("position")).Write(out);
        KFS_StreamID(Name(std::string(39, 'n').c_str())).Write(out);
        KFS_StreamID(5).Write(out);
    });
    EXPECT_EQ((std::vector<std::string>{
                  "LIST kfsi", "  kfix 01020304", "  kfmn " + AtomHex("position"),            //
                  "LIST kfsi", "  kfix ffffffff", "  kfmn " + AtomHex(std::string(39, 'n')),  //
                  "LIST kfsi", "  kfix 00000005", "  kfmn " + AtomHex(""),                    //
              }),
              file.Lines());
    file.Read([](CKF_File* in) {
        KFS_StreamID id(77, Name("what was there"));
        id.Read(in, nullptr);
        EXPECT_EQ(0x01020304u, id.GetIndex());
        EXPECT_EQ(Name("position"), id.GetMatchName());
        id.Read(in, nullptr);
        EXPECT_EQ(KFS_StreamID::NoIndex, id.GetIndex());
        EXPECT_EQ(Name(std::string(39, 'n').c_str()), id.GetMatchName());
        id.Read(in, nullptr);
        EXPECT_EQ(5u, id.GetIndex());
        EXPECT_FALSE(id.GetMatchName().IsValid());
        EXPECT_EQ(CKF_Err_NoSuchChunk, KFSp_Boundary([&] { id.Read(in, nullptr); }));
        EXPECT_EQ(5u, id.GetIndex()) << "as it was";
    });
}

TEST(Longs, AreSignedAndBigEndian)
{
    constexpr int Id = CKF_Id("long");
    int const values[] = {0, 1, -1, 0x01020304, INT_MIN, INT_MAX};
    MemoryFile const file([&](CKF_File* out) {
        for (int const value : values) KFSp_WriteLong(out, Id, value);
        EXPECT_EQ(0, CKF_WriteAtom(out, Id, 2, "\x7f\x01"));
    });
    EXPECT_EQ((std::vector<std::string>{"long 00000000", "long 00000001", "long ffffffff", "long 01020304",
                                        "long 80000000", "long 7fffffff", "long 7f01"}),
              file.Lines());
    file.Read([&](CKF_File* in) {
        for (int const value : values) EXPECT_EQ(value, KFSp_ReadLong(in, nullptr, Id));
        EXPECT_EQ(0x7f010000, KFSp_ReadLong(in, nullptr, Id)) << "what a shorter atom doesn't say is zero";
        EXPECT_EQ(CKF_Err_NoSuchChunk, KFSp_Boundary([&] { KFSp_ReadLong(in, nullptr, Id); }));
    });
}

TEST(MatchNameAtoms, ANameThatFillsItsAtomEndsThere)
{
    std::string unknown = "known to no code";
    unknown.resize(40, '\0');
    MemoryFile const file([&](CKF_File* out) {
        EXPECT_EQ(0, CKF_WriteAtom(out, CKF_Id("kfmn"), 40, std::string(40, 'q').data()));
        EXPECT_EQ(0, CKF_WriteAtom(out, CKF_Id("kfmn"), 3, "abc"));
        EXPECT_EQ(0, CKF_WriteAtom(out, CKF_Id("kfmn"), 8, "ab\0stale"));
        EXPECT_EQ(0, CKF_WriteAtom(out, CKF_Id("kfmn"), 40, unknown.data()));
        KFS_MatchName::WriteEndOfGroupMarker(out);
    });
    EXPECT_EQ("kfmn " + AtomHex("ZQVM Group End"), file.Lines().back());
    file.Read([](CKF_File* in) {
        KFS_MatchName name;
        for (std::string const& text : {std::string(40, 'q'), std::string("abc"), std::string("ab")}) {
            name.Read(in, nullptr);
            EXPECT_EQ(Name(text.c_str()), name) << "the hash is of all that was there";
        }
        name.Read(in, nullptr);
        EXPECT_STREQ("known to no code", reinterpret_cast<char const*>(name.GetName()));
        EXPECT_FALSE(name.IsEndOfGroupMarker());
        name.Read(in, nullptr);
        EXPECT_TRUE(name.IsEndOfGroupMarker());
    });
}

TEST(MatchNameAtoms, AHashWithoutATextIsNotWritten)
{
    ReportRecorder reports;
    KFS_MatchName foreign;
    foreign.SetGuid(hearth::utility::Guid({9, 8, 7}));
    CKF_File file;
    ASSERT_EQ(0, file.CreateInMemory());
    EXPECT_EQ(3, KFSp_Boundary([&] { foreign.Write(&file); }));
    EXPECT_EQ(1u, reports.Take().size());
}

}  // namespace
