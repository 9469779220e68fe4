// Saving to disk: the target is the old file or the new one, whole, and nothing stays beside it.
#include "tests/services/chunkbytes.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <set>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

// A folder of its own for one test.
class Folder {
public:
    Folder()
    {
        std::string name = testing::TempDir() + "chunkfile_save_XXXXXX";
        path_ = ::mkdtemp(name.data());
    }
    ~Folder() { fs::remove_all(path_); }

    std::string Path(char const* name = "project.kfs") const { return (path_ / name).string(); }
    std::set<std::string> Names() const
    {
        std::set<std::string> names;
        for (fs::directory_entry const& entry : fs::directory_iterator(path_))
            names.insert(entry.path().filename().string());
        return names;
    }

private:
    fs::path path_;
};

using Names = std::set<std::string>;

std::string Content(std::string const& path)
{
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}

void Put(std::string const& path, std::string const& content)
{
    std::ofstream(path, std::ios::binary) << content;
}

// A save with every kind of write. Looks at no result, as the library does in places; the commit has to know.
int WriteEverything(CKF_File* file)
{
    const int thrown = Thrown([&] {
        const CKF_ScWriteList outer(file, CKF_Id("kfgp"), 0);
        CKF_WriteString(file, CKF_Id("kfsn"), Text("name"), 0);
        CKF_ChunkInfo leaf{};
        CKF_BeginChunkWrite(file, CKF_ListId, 0, CKF_Id("kfbs"), &leaf);
        CKF_WriteAtom(file, CKF_Id("cdat"), 3, "abc");
        CKF_WriteUTF16(file, Text("expression"));
        if (char** const handle = CKF_NewHandleFromString(Text("old"), true)) {
            CKF_WriteHandle(file, CKF_Id("expr"), handle);
            Q_FreeHandle(handle);
        } else {
            throw Q_Err_OutOfMemory;
        }
        SEQ_Head** list = nullptr;
        if (const int code = SEQ_New(0, 3, 4, 1, &list)) throw code;
        int inserted = 0;
        for (char const* item : {"abc", "def"})
            if (inserted == 0) inserted = SEQ_Insert(item, -1, list);
        SEQ_Write(list, file);
        SEQ_Dispose(list, 0);
        if (inserted != 0) throw inserted;
        CKF_EndChunkWrite(file, &leaf);
        const std::string big(200000, 'B');  // more than is buffered
        CKF_WriteAtom(file, CKF_Id("big_"), static_cast<int>(big.size()), big.data());
    });
    const int committed = file->Commit();
    return thrown != 0 ? thrown : committed;
}

std::string Expected()
{
    return Form(List("kfgp", Atom("kfsn", "name") +
                                 List("kfbs", Atom("cdat", "abc") + Atom("Utf8", "expression") + Atom("expr", "old") +
                                                  Atom("seql", Long(3) + Long(2) + "abcdef")) +
                                 Atom("big_", std::string(200000, 'B'))));
}

// Makes the n-th call fail, or the n-th of one kind.
struct FailNth : CKF_IoHook {
    explicit FailNth(int n) : left(n) {}
    int Before(CKF_IoCall call, std::size_t) noexcept override
    {
        last = call;
        return left > 0 && --left == 0 ? ENOSPC : 0;
    }
    bool Fired() const { return left == 0; }

    int left;
    CKF_IoCall last = CKF_IoCall::Create;
};

TEST(ChunkFileSave, ReplacesTheTargetWhole)
{
    const Folder folder;
    for (bool const exists : {false, true}) {
        if (exists) Put(folder.Path(), "the old file");
        CKF_File file;
        ASSERT_EQ(0, file.Create(folder.Path().c_str()));
        EXPECT_EQ(exists ? 2u : 1u, folder.Names().size()) << "what is written is beside the target";
        ASSERT_EQ(0, WriteEverything(&file)) << file.LastErrorText();
        EXPECT_EQ(Names{"project.kfs"}, folder.Names());
        EXPECT_EQ(Expected(), Content(folder.Path()));
        EXPECT_TRUE(file.GetBytes().empty());
        EXPECT_EQ(CKF_Err_NotOpen, CKF_WriteAtom(&file, CKF_Id("late"), 0, nullptr));
    }
}

TEST(ChunkFileSave, EveryCallThatFailsLeavesTheOldFile)
{
    int n = 1;
    std::set<CKF_IoCall> failed;
    for (;; ++n) {
        SCOPED_TRACE(n);
        ASSERT_LT(n, 1000);
        const Folder folder;
        Put(folder.Path(), "the old file");
        FailNth hook(n);
        CKF_File file;
        int code = file.Create(folder.Path().c_str(), &hook);
        if (code == 0) code = WriteEverything(&file);
        if (!hook.Fired()) {
            EXPECT_EQ(0, code);
            EXPECT_EQ(Expected(), Content(folder.Path()));
            break;
        }
        failed.insert(hook.last);
        EXPECT_EQ(CKF_Err_Io, code) << "the failure came out";
        EXPECT_EQ(CKF_Err_Io, file.LastError());
        EXPECT_NE(nullptr, std::strstr(file.LastErrorText(), "No space left")) << file.LastErrorText();
        EXPECT_EQ(Names{"project.kfs"}, folder.Names()) << "nothing stays beside it";
        // Behind the renaming the new file is in place, whatever the folder says.
        EXPECT_EQ(hook.last == CKF_IoCall::SyncFolder ? Expected() : "the old file", Content(folder.Path()));
    }
    EXPECT_EQ(7u, failed.size()) << "each kind of call was made to fail";
}

TEST(ChunkFileSave, EveryWriteThatFailsInMemoryIsTold)
{
    for (int n = 1;; ++n) {
        SCOPED_TRACE(n);
        ASSERT_LT(n, 1000);
        FailNth hook(n);
        CKF_File file;
        int code = file.CreateInMemory(&hook);
        if (code == 0) code = WriteEverything(&file);
        if (!hook.Fired()) {
            EXPECT_EQ(Expected(), Bytes(file));
            return;
        }
        EXPECT_EQ(CKF_Err_Io, code);
        EXPECT_TRUE(file.GetBytes().empty());
    }
}

TEST(ChunkFileSave, EveryAllocationThatFailsIsTold)
{
    const Q_MemoryCount before = Q_MemoryLive(nullptr);
    for (bool const disk : {false, true})
        for (int n = 1;; ++n) {
            SCOPED_TRACE(testing::Message() << (disk ? "disk " : "memory ") << n);
            ASSERT_LT(n, 1000);
            const Folder folder;
            Put(folder.Path(), "the old file");
            bool fired = false;
            {
                CKF_File file;
                int code = 0;
                Q_FailAllocation(n);
                try {
                    code = disk ? file.Create(folder.Path().c_str()) : file.CreateInMemory();
                    if (code == 0) code = WriteEverything(&file);
                } catch (std::bad_alloc const&) {  // the texts that are made here, not the file
                    code = Q_Err_OutOfMemory;
                }
                fired = Q_FailAllocationFired();
                Q_FailAllocation(0);
                if (fired) {
                    EXPECT_EQ(Q_Err_OutOfMemory, code);
                } else {
                    EXPECT_EQ(0, code);
                    EXPECT_EQ(Expected(), disk ? Content(folder.Path()) : Bytes(file));
                }
            }
            EXPECT_EQ(Names{"project.kfs"}, folder.Names());
            if (!fired) break;
        }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(ChunkFileSave, WhatIsNotCommittedLeavesNothing)
{
    const Folder folder;
    Put(folder.Path(), "the old file");
    const auto begin = [&](CKF_File& file) {
        ASSERT_EQ(0, file.Create(folder.Path().c_str()));
        ASSERT_EQ(0, CKF_WriteAtom(&file, CKF_Id("cdat"), 3, "abc"));
        ASSERT_EQ(2u, folder.Names().size());
    };
    {
        CKF_File file;
        begin(file);
    }
    EXPECT_EQ(Names{"project.kfs"}, folder.Names()) << "destroyed";
    CKF_File file;
    begin(file);
    file.Close();
    EXPECT_EQ(Names{"project.kfs"}, folder.Names()) << "closed";
    begin(file);
    EXPECT_EQ(CKF_Err_NotAChunkFile, file.Open(folder.Path().c_str()));
    EXPECT_EQ(Names{"project.kfs"}, folder.Names()) << "opened for something else";
    begin(file);
    CKF_WriteAtom(&file, 0, 0, nullptr);
    EXPECT_EQ(CKF_Err_BadArgument, file.Commit());
    EXPECT_EQ(Names{"project.kfs"}, folder.Names()) << "failed";
    EXPECT_EQ("the old file", Content(folder.Path()));
}

TEST(ChunkFileSave, TwoSavesToOnePlaceDontMeet)
{
    const Folder folder;
    CKF_File first, second;
    ASSERT_EQ(0, first.Create(folder.Path().c_str()));
    ASSERT_EQ(0, second.Create(folder.Path().c_str()));
    CKF_WriteAtom(&first, CKF_Id("who_"), 5, "first");
    CKF_WriteAtom(&second, CKF_Id("who_"), 6, "second");
    EXPECT_EQ(0, second.Commit());
    EXPECT_EQ(Form(Atom("who_", "second")), Content(folder.Path()));
    EXPECT_EQ(0, first.Commit());
    EXPECT_EQ(Form(Atom("who_", "first")), Content(folder.Path()));
    EXPECT_EQ(Names{"project.kfs"}, folder.Names());
}

TEST(ChunkFileSave, ALinkStaysALinkAndRightsStay)
{
    const Folder folder;
    Put(folder.Path("real.kfs"), "the old file");
    ASSERT_EQ(0, ::chmod(folder.Path("real.kfs").c_str(), 0640));
    fs::create_symlink("real.kfs", folder.Path("link.kfs"));
    CKF_File file;
    ASSERT_EQ(0, file.Create(folder.Path("link.kfs").c_str()));
    ASSERT_EQ(0, file.Commit());
    EXPECT_TRUE(fs::is_symlink(folder.Path("link.kfs")));
    EXPECT_EQ(Form(""), Content(folder.Path("real.kfs")));
    EXPECT_EQ(fs::perms(0640), fs::status(folder.Path("real.kfs")).permissions());
    EXPECT_EQ((Names{"link.kfs", "real.kfs"}), folder.Names());
}

TEST(ChunkFileSave, APlaceThatCantBeWrittenIsRefusedAtOnce)
{
    const Folder folder;
    for (std::string const& path : {folder.Path("no/such/folder.kfs"), folder.Path("new/"), folder.Path("."),
                                    std::string("/dev/null"), std::string()}) {
        CKF_File file;
        EXPECT_EQ(CKF_Err_Io, file.Create(path.c_str())) << path;
        EXPECT_NE(nullptr, std::strstr(file.LastErrorText(), path.c_str())) << file.LastErrorText();
        EXPECT_EQ(CKF_Err_Io, CKF_WriteAtom(&file, CKF_Id("cdat"), 0, nullptr));
        EXPECT_EQ(CKF_Err_Io, file.Commit());
    }
    EXPECT_EQ(Names{}, folder.Names());
}

TEST(ChunkFileSave, OnlyRegularProjectFilesAreOpened)
{
    const Folder folder;
    Put(folder.Path("text"), "KFS is not KFSF");
    Put(folder.Path("empty"), "");
    Put(folder.Path("cut"), Form("").substr(0, 20));
    ASSERT_EQ(0, ::mkfifo(folder.Path("pipe").c_str(), 0600));
    const struct {
        char const* name;
        int code;
    } rows[] = {
        {"text", CKF_Err_NotAChunkFile},
        {"empty", CKF_Err_NotAChunkFile},
        {"cut", CKF_Err_Corrupt},
        {"pipe", CKF_Err_Io},
        {".", CKF_Err_Io},
        {"missing", CKF_Err_Io},
    };
    const Q_MemoryCount before = Q_MemoryLive("project file");
    for (auto const& row : rows) {
        CKF_File file;
        EXPECT_EQ(row.code, file.Open(folder.Path(row.name).c_str())) << row.name;
        EXPECT_STRNE("", file.LastErrorText());
        EXPECT_EQ(before, Q_MemoryLive("project file")) << "a file that didn't open holds nothing";
    }
}

TEST(ChunkFileSave, AFileThatIsOpenDoesNotNeedThePathAnyMore)
{
    const Folder folder;
    Put(folder.Path(), NestedSample());
    const Q_MemoryCount before = Q_MemoryLive("project file");
    {
        CKF_File file;
        ASSERT_EQ(0, file.Open(folder.Path().c_str()));
        EXPECT_EQ(static_cast<long long>(NestedSample().size()), Q_MemoryLive("project file").bytes - before.bytes);
        ASSERT_EQ(0, ::truncate(folder.Path().c_str(), 10));
        EXPECT_EQ(NestedOutline, Outline(&file));
    }
    EXPECT_EQ(before, Q_MemoryLive("project file"));
}

}  // namespace
