#include "frame/frame.h"
#include "persist/longs_private.h"
#include "persist/oldstreamid.h"
#include "tests/persist/leaffile.h"
#include "tree/streampath.h"

#include <climits>

// Numbers, names, identifiers and paths in files.

namespace {

using Path = KFS_StreamIDPath;
using Lines = std::vector<std::string>;

KFS_MatchName Name(std::string const& text)
{
    return KFS_MatchName(text.c_str(), true);
}
std::string Atom40(std::string text)
{
    text.resize(40, '\0');
    return MemoryFile::Hex(Span(text));
}
std::string Letters(Path const& path)
{
    std::string letters;
    for (KFS_StreamID const& id : path.GetPathConst())
        letters += reinterpret_cast<char const*>(id.GetMatchName().GetName());
    return letters;
}

class NameChunks : public StreamTest {};

TEST_F(NameChunks, AreTheseBytes)
{
    constexpr int LongId = CKF_Id("long");
    int const values[] = {0, -1, 0x01020304, INT_MIN, INT_MAX};
    KFS_StreamID const ids[] = {{0x01020304, Name("position")}, {Name(std::string(39, 'n'))}, {5}};
    std::string const texts[] = {std::string(40, 'q'), "abc", "ab"};  // the hash is of all that was there
    Path const path(KFS_StreamID(2, Name("b")), Name("c"));
    MemoryFile const file([&](CKF_File* out) {
        for (int const value : values) KFSp_WriteLong(out, LongId, value);
        EXPECT_EQ(0, CKF_WriteAtom(out, LongId, 2, "\x7f\x01"));
        for (std::string const& atom : {texts[0], texts[1], std::string("ab\0stale", 8)})
            EXPECT_EQ(0, CKF_WriteAtom(out, CKF_Id("kfmn"), static_cast<int>(atom.size()), atom.data()));
        KFS_MatchName::WriteEndOfGroupMarker(out);
        for (KFS_StreamID const& id : ids) id.Write(out);
        Path().Write(out);
        path.Write(out);
        Path::WriteSentinel(out);
        KFS_OldStreamID const old{{0x01020304, 0xFFFFFFFE}};
        EXPECT_EQ(0, KFS_WriteOldStreamID(&old, out));
    });
    EXPECT_EQ((Lines{"long 00000000",
                     "long ffffffff",
                     "long 01020304",
                     "long 80000000",
                     "long 7fffffff",
                     "long 7f01",
                     "kfmn " + Atom40(texts[0]),
                     "kfmn 616263",
                     "kfmn 6162007374616c65",
                     "kfmn " + Atom40("ZQVM Group End"),
                     "LIST kfsi",
                     "  kfix 01020304",
                     "  kfmn " + Atom40("position"),  //
                     "LIST kfsi",
                     "  kfix ffffffff",
                     "  kfmn " + Atom40(std::string(39, 'n')),  //
                     "LIST kfsi",
                     "  kfix 00000005",
                     "  kfmn " + Atom40(""),  //
                     "LIST kfsp",
                     "  kfot ffffffff",
                     "  kfpl 00000000",  //
                     "LIST kfsp",
                     "  kfot ffffffff",
                     "  kfpl 00000002",  //
                     "  LIST kfsi",
                     "    kfix 00000002",
                     "    kfmn " + Atom40("b"),  //
                     "  LIST kfsi",
                     "    kfix ffffffff",
                     "    kfmn " + Atom40("c"),  //
                     "LIST kfsp",
                     "  kfot ffffffff",
                     "  kfpl 00000001",  //
                     "  LIST kfsi",
                     "    kfix ffffffff",
                     "    kfmn " + Atom40("ZQVM End of path sentinel"),
                     "kfsi 01020304fffffffe"}),
              file.Lines());
    file.Read([&](CKF_File* in) {
        for (int const value : values) EXPECT_EQ(value, KFSp_ReadLong(in, nullptr, LongId));
        EXPECT_EQ(0x7f010000, KFSp_ReadLong(in, nullptr, LongId)) << "what a shorter atom doesn't say is zero";
        EXPECT_EQ(CKF_Err_NoSuchChunk, KFSp_Boundary([&] { KFSp_ReadLong(in, nullptr, LongId); }));
        KFS_MatchName name;
        for (std::string const& text : texts) {
            name.Read(in, nullptr);
            EXPECT_EQ(Name(text), name);
            EXPECT_STREQ(text.substr(0, 39).c_str(), reinterpret_cast<char const*>(name.GetName()));
            EXPECT_FALSE(name.IsEndOfGroupMarker());
        }
        name.Read(in, nullptr);
        EXPECT_TRUE(name.IsEndOfGroupMarker());
        KFS_StreamID id(77, Name("what was there"));
        for (KFS_StreamID const& written : ids) {
            id.Read(in, nullptr);
            EXPECT_EQ(written.GetIndex(), id.GetIndex());
            EXPECT_EQ(written.GetMatchName(), id.GetMatchName());
        }
        Path read(Name("gone"));
        read.Read(in, nullptr);
        EXPECT_TRUE(read.IsEmpty() && !read.IsSentinel());
        read.Read(in, nullptr);
        EXPECT_EQ(path.MakeUID().GuidToBytes(), read.MakeUID().GuidToBytes());
        EXPECT_FALSE(read.IsSentinel());
        read.Read(in, nullptr);
        EXPECT_TRUE(read.IsSentinel());
        EXPECT_TRUE(Path(KFS_StreamID(7, read.GetTail().GetMatchName())).IsSentinel()) << "whatever its index";
        EXPECT_FALSE(Path(read, read.GetTail()).IsSentinel());
        EXPECT_EQ(CKF_Err_NoSuchChunk, KFSp_Boundary([&] { id.Read(in, nullptr); }));
        EXPECT_EQ(5u, id.GetIndex()) << "as it was";
        KFS_OldStreamID old{{7, 7}};
        EXPECT_EQ(0, KFS_ReadOldStreamID(in, nullptr, &old));
        EXPECT_EQ(CKF_Err_NoSuchChunk, KFS_ReadOldStreamID(in, nullptr, &old));
        EXPECT_TRUE(old.words[0] == 0x01020304 && old.words[1] == 0xFFFFFFFE);
    });
}

TEST_F(NameChunks, AHashWithoutATextIsNotWritten)
{
    KFS_MatchName foreign;
    foreign.SetGuid(hearth::utility::Guid({9, 8, 7}));
    CKF_File file;
    ASSERT_EQ(0, file.CreateInMemory());
    EXPECT_EQ(3, Thrown([&] { foreign.Write(&file); }));
    EXPECT_EQ(1u, reports.Take().size());
}

// More than the caller's record can hold.
TEST_F(NameChunks, AnOldIdIsTwoWordsWhateverTheFileSays)
{
    struct {
        KFS_OldStreamID id;
        unsigned int behind;
    } guarded{{{0, 0}}, 0x5A5A5A5A};
    std::string const big = Form(Atom("kfsi", std::string(40, '\x11')));
    CKF_File open;
    ASSERT_EQ(0, open.Open(Span(big)));
    EXPECT_EQ(0, KFS_ReadOldStreamID(&open, nullptr, &guarded.id));
    EXPECT_EQ(0x11111111u, guarded.id.words[1]);
    EXPECT_EQ(0x5A5A5A5Au, guarded.behind);
}

// A path's length is only a claim, and the number of an old type, if any, goes to the application.
TEST_F(NameChunks, HeadsOfPaths)
{
    static int askedFor = -1;
    static std::string askedWith;
    KFS_AppCallbacks callbacks{};
    callbacks.oldPathFixupFunc = [](int oldType, Path* path) {
        askedFor = oldType;
        askedWith = Letters(*path);
        *path = Path(Name("fixed"));
    };
    struct {
        int oldType, length, code;
        char const* letters;  // as the application gets them
    } const rows[] = {{-1, 2, 0, "ab"},
                      {-2, 2, 0, "ab"},
                      {0, 2, 0, "ab"},
                      {12, 1, 0, "a"},
                      {-1, 0, 0, ""},
                      {-1, -1, 0, ""},
                      {-1, INT_MIN, 0, ""},
                      {-1, 3, CKF_Err_NoSuchChunk, "ab"},
                      {-1, 1000, CKF_Err_NoSuchChunk, "ab"},
                      {-1, INT_MAX, CKF_Err_NoSuchChunk, "ab"}};
    for (auto const& row : rows) {
        for (bool const hasCallback : {true, false}) {
            SCOPED_TRACE(testing::Message() << row.oldType << ' ' << row.length << ' ' << hasCallback);
            KFS_ClearCallbacks();
            if (hasCallback) KFS_SetCallbacks(callbacks);
            askedFor = -1;
            askedWith.clear();
            MemoryFile const file([&](CKF_File* out) {
                CKF_ScWriteList const list(out, CKF_Id("kfsp"), 0);
                KFSp_WriteLong(out, CKF_Id("kfot"), row.oldType);
                KFSp_WriteLong(out, CKF_Id("kfpl"), row.length);
                for (char const* const name : {"a", "b"}) KFS_StreamID(Name(name)).Write(out);
            });
            Path path(Name("gone"));
            file.Read([&](CKF_File* in) { EXPECT_EQ(row.code, Thrown([&] { path.Read(in, nullptr); })); });
            bool const asked = row.oldType >= 0 && hasCallback;
            EXPECT_EQ(asked ? "fixed" : row.letters, Letters(path)) << "what was read stays";
            EXPECT_EQ(asked ? row.oldType : -1, askedFor);
            EXPECT_EQ(asked ? row.letters : "", askedWith);
            EXPECT_GT(10u, path.GetPath().capacity());
        }
    }
    KFS_ClearCallbacks();
}

}  // namespace
