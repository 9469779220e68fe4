// Saving to disk: the target is the old file or the new one, whole, and nothing stays beside it.
#include "tests/services/chunkbytes.h"
#include "tests/support/scratchfolder.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <set>
#include <string>
#include <vector>

namespace {

namespace fs = std::filesystem;

char const* const Project = "project.kfs";

using Names = std::set<std::string>;

// A save with every kind of write. Looks at no result, as the library does in places; the commit has to know.
int WriteEverything(CKF_File* file)
{
    int const thrown = Thrown([&] {
        const CKF_ScWriteList outer(file, CKF_Id("kfgp"), 0);
        static_cast<void>(CKF_WriteString(file, CKF_Id("kfsn"), Text("name"), 0));
        CKF_ChunkInfo leaf{};
        static_cast<void>(CKF_BeginChunkWrite(file, CKF_ListId, 0, CKF_Id("kfbs"), &leaf));
        static_cast<void>(CKF_WriteAtom(file, CKF_Id("cdat"), 3, "abc"));
        CKF_WriteUTF16(file, Text("expression"));
        if (char** const handle = CKF_NewHandleFromString(Text("old"), true)) {
            static_cast<void>(CKF_WriteHandle(file, CKF_Id("expr"), handle));
            Q_FreeHandle(handle);
        } else {
            throw Q_Err_OutOfMemory;
        }
        SEQ_Head** list = nullptr;
        if (int const code = SEQ_New(0, 3, 4, 1, &list)) throw code;
        int inserted = 0;
        for (char const* item : {"abc", "def"})
            if (inserted == 0) inserted = SEQ_Insert(item, -1, list);
        static_cast<void>(SEQ_Write(list, file));
        static_cast<void>(SEQ_Dispose(list, 0));
        if (inserted != 0) throw inserted;
        static_cast<void>(CKF_EndChunkWrite(file, &leaf));
        std::string const big(200000, 'B');  // more than is buffered
        static_cast<void>(CKF_WriteAtom(file, CKF_Id("big_"), static_cast<int>(big.size()), big.data()));
    });
    int const committed = file->Commit();
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
        return left != 0 && --left == 0 ? ENOSPC : 0;
    }
    int left;
    CKF_IoCall last = CKF_IoCall::Create;
};

// Every call of the operating system and every allocation fails once: the failure comes out, and there is the old file
// and nothing beside it. The last round of each kind is undisturbed.
TEST(ChunkFileSave, WhateverFailsLeavesTheOldFileAndNothingElse)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    std::set<CKF_IoCall> failed;
    for (bool const disk : {true, false})
        for (bool const memory : {true, false})
            for (int n = 1, fired = 1; fired; ++n) {
                SCOPED_TRACE(testing::Message()
                             << (disk ? "disk " : "memory ") << (memory ? "allocation " : "call ") << n);
                ScratchFolder const folder;
                folder.Write(Project, "the old file");
                {
                    FailNth hook(memory ? -1 : n);
                    CKF_File file;
                    int code = 0;
                    Q_FailAllocation(memory ? n : 0);
                    try {
                        code = disk ? file.Create(folder.Path(Project).c_str(), &hook) : file.CreateInMemory(&hook);
                        if (code == 0) code = WriteEverything(&file);
                    } catch (std::bad_alloc const&) {  // the texts that are made here, not the file
                        code = Q_Err_OutOfMemory;
                    }
                    fired = memory ? Q_FailAllocationFired() : hook.left == 0;
                    Q_FailAllocation(0);
                    EXPECT_EQ(!fired ? 0 : memory ? Q_Err_OutOfMemory : CKF_Err_Io, code);
                    if (fired && !memory) {
                        failed.insert(hook.last);
                        EXPECT_EQ(CKF_Err_Io, file.LastError());
                        EXPECT_NE(nullptr, std::strstr(file.LastErrorText(), "No space left")) << file.LastErrorText();
                    }
                    EXPECT_EQ(fired || disk ? "" : Expected(), Bytes(file));
                    // Behind the renaming the new file is in place, whatever the folder says.
                    bool const replaced = disk && (!fired || (!memory && hook.last == CKF_IoCall::SyncFolder));
                    EXPECT_EQ(replaced ? Expected() : "the old file", FileContent(folder.Path(Project)));
                }
                EXPECT_EQ(Names{Project}, folder.Names());
                ASSERT_LT(n, 1000);
            }
    EXPECT_EQ(7u, failed.size()) << "each kind of call was made to fail";
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(ChunkFileSave, WhatIsNotCommittedLeavesNothing)
{
    ScratchFolder const folder;
    folder.Write(Project, "the old file");
    std::string const path = folder.Path(Project), made = folder.Path("new.kfs");
    constexpr int codes[] = {0, 0, CKF_Err_NotAChunkFile, CKF_Err_BadArgument};
    for (int const end : {0, 1, 2, 3}) {  // destroyed, closed, opened for something else, failed
        SCOPED_TRACE(end);
        {
            CKF_File file;
            EXPECT_EQ(0, file.Create(path.c_str()));
            EXPECT_EQ(0, CKF_WriteAtom(&file, CKF_Id("cdat"), 3, "abc"));
            EXPECT_EQ(2u, folder.Names().size());
            if (end == 1) file.Close();
            EXPECT_EQ(codes[end], end == 2   ? file.Open(path.c_str())
                                  : end == 3 ? CKF_WriteAtom(&file, 0, 0, nullptr) | file.Commit()
                                             : 0);
            EXPECT_EQ(end == 0 ? 2u : 1u, folder.Names().size());
        }
        EXPECT_EQ(Names{Project}, folder.Names());
    }
    EXPECT_EQ("the old file", FileContent(path));
    CKF_File file;
    EXPECT_EQ(0, file.Create(made.c_str()) + file.Commit());
    EXPECT_EQ(Form(""), FileContent(made)) << "there was none";
    EXPECT_EQ(CKF_Err_NotOpen, CKF_WriteAtom(&file, CKF_Id("late"), 0, nullptr));
}

TEST(ChunkFileSave, ALinkStaysALinkAndRightsStay)
{
    auto const owner = ::geteuid() == 0 ? std::pair<uid_t, gid_t>(12, 34) : std::pair(::geteuid(), ::getegid());
    for (unsigned const mode : {0600u, 0640u, 0444u, 02755u}) {
        SCOPED_TRACE(mode);
        ScratchFolder const folder;
        std::string const real = folder.Write("deep/real.kfs", "the old file");
        ASSERT_EQ(0, ::chown(real.c_str(), owner.first, owner.second));
        ASSERT_EQ(0, ::chmod(real.c_str(), mode));
        fs::create_symlink("real.kfs", folder.Path("deep/near.kfs"));
        fs::create_symlink("deep/near.kfs", folder.Path("link.kfs"));
        for (bool const exists : {true, false}) {
            if (!exists) fs::remove(real);
            CKF_File file;
            ASSERT_EQ(0, file.Create(folder.Path("link.kfs").c_str()));
            EXPECT_EQ((Names{"deep", "link.kfs"}), folder.Names()) << "it is where the file is to be";
            for (fs::directory_entry const& entry : fs::directory_iterator(folder.Path("deep")))
                if (exists && entry.path().string().find(".saving-") != std::string::npos)
                    EXPECT_EQ(fs::perms(0600), entry.status().permissions()) << "nobody else may read it meanwhile";
            ASSERT_EQ(0, file.Commit());
            EXPECT_TRUE(fs::is_symlink(folder.Path("link.kfs")) && fs::is_symlink(folder.Path("deep/near.kfs")));
            EXPECT_TRUE(!fs::is_symlink(real) && FileContent(real) == Form(""));
            struct stat now;
            ASSERT_EQ(0, ::stat(real.c_str(), &now));
            EXPECT_TRUE(!exists || (now.st_mode & 07777) == mode) << now.st_mode;
            EXPECT_TRUE(!exists || std::pair(now.st_uid, now.st_gid) == owner) << now.st_uid;
        }
    }
}

// A process that begins to write and then dies by a signal; whether it takes care of signals itself.
void DieWriting(std::string const& path, int signal, bool takesCare)
{
    pid_t const child = ::fork();
    if (child == 0) {
        ::signal(signal, SIG_DFL);  // whoever runs the tests may ignore it
        if (takesCare) CKF_RemoveTemporariesOnSignals();
        CKF_FileWriter file;
        if (file.Create(path.c_str()) == 0) ::raise(signal);
        ::_exit(1);
    }
    int status = 0;
    ASSERT_EQ(child, ::waitpid(child, &status, 0));
    ASSERT_TRUE(WIFSIGNALED(status));
    EXPECT_EQ(signal, WTERMSIG(status));
}

TEST(ChunkFileSave, WhatADeadProcessLeftGoesWithTheNextSave)
{
    ScratchFolder const folder;
    std::string const other = std::string(250, 'n');  // has no room for what temporary files are called
    for (int const signal : {SIGINT, SIGTERM, SIGHUP, SIGXFSZ}) {
        DieWriting(folder.Path(Project), signal, true);
        EXPECT_EQ(Names{}, folder.Names()) << signal;
    }
    for (std::string const& name : {std::string(Project), other}) DieWriting(folder.Path(name), SIGKILL, true);
    EXPECT_EQ(2u, folder.Names().size());
    CKF_FileWriter living, file;
    ASSERT_EQ(0, living.Create(folder.Path(Project).c_str()));
    EXPECT_EQ(2u, folder.Names().size()) << "the dead one's is gone, that of the other target isn't";
    ASSERT_EQ(0, file.Create(folder.Path(Project).c_str()));
    EXPECT_EQ(3u, folder.Names().size()) << "nobody takes it from the living";
    file.Append("second", 6);
    living.Append("first", 5);
    EXPECT_EQ(0, file.Commit());
    EXPECT_EQ("second", FileContent(folder.Path(Project)));
    EXPECT_EQ(0, living.Commit());
    EXPECT_EQ("first", FileContent(folder.Path(Project))) << "two saves to one place don't meet";
    ASSERT_EQ(0, file.Create(folder.Path(other).c_str()));
    EXPECT_EQ(0, file.Commit());
    EXPECT_EQ((Names{Project, other}), folder.Names());
}

TEST(ChunkFileSave, OnlyWhoAsksForItWritesIntoAPipe)
{
    ScratchFolder const folder;
    std::string const pipe = folder.Path("pipe");
    ASSERT_EQ(0, ::mkfifo(pipe.c_str(), 0600));
    CKF_FileWriter file;
    EXPECT_EQ(EINVAL, file.Create(pipe.c_str()));
    int const end = ::open(pipe.c_str(), O_RDONLY | O_NONBLOCK);
    ASSERT_EQ(0, file.Create(pipe.c_str(), CKF_Target::FileOrStream));
    file.Append("abc", 3);
    EXPECT_EQ(0, file.Commit());
    char got[8] = "";
    EXPECT_EQ(3, ::read(end, got, sizeof got));
    EXPECT_STREQ("abc", got);
    ::close(end);
    EXPECT_EQ(Names{"pipe"}, folder.Names());
}

TEST(ChunkFileSave, OnlyPlacesForFilesAreWrittenAndOnlyRegularProjectFilesOpened)
{
    ScratchFolder const folder;
    for (std::string const& path : {folder.Path("no/such/folder.kfs"), folder.Path("new/"), folder.Path("."),
                                    std::string("/dev/null"), std::string()}) {
        CKF_File file;
        EXPECT_EQ(CKF_Err_Io, file.Create(path.c_str())) << path;
        EXPECT_NE(nullptr, std::strstr(file.LastErrorText(), path.c_str())) << file.LastErrorText();
        EXPECT_EQ(CKF_Err_Io, CKF_WriteAtom(&file, CKF_Id("cdat"), 0, nullptr));
        EXPECT_EQ(CKF_Err_Io, file.Commit());
    }
    EXPECT_EQ(Names{}, folder.Names());
    folder.Write("text", "KFS is not KFSF");
    folder.Write("empty", "");
    folder.Write("cut", Form("").substr(0, 20));
    ASSERT_EQ(0, ::mkfifo(folder.Path("pipe").c_str(), 0600));
    std::pair<char const*, int> const rows[] = {{"text", CKF_Err_NotAChunkFile},
                                                {"empty", CKF_Err_NotAChunkFile},
                                                {"cut", CKF_Err_Corrupt},
                                                {"pipe", CKF_Err_Io},
                                                {".", CKF_Err_Io},
                                                {"missing", CKF_Err_Io}};
    const Q_MemoryCount before = Q_MemoryLive("project file");
    for (auto const& [name, code] : rows) {
        CKF_File file;
        EXPECT_EQ(code, file.Open(folder.Path(name).c_str())) << name;
        EXPECT_STRNE("", file.LastErrorText());
        EXPECT_EQ(before, Q_MemoryLive("project file")) << "a file that didn't open holds nothing";
    }
    {
        folder.Write(Project, NestedSample());
        CKF_File file;
        ASSERT_EQ(0, file.Open(folder.Path(Project).c_str()));
        EXPECT_EQ(static_cast<long long>(NestedSample().size()), Q_MemoryLive("project file").bytes - before.bytes);
        ASSERT_EQ(0, ::truncate(folder.Path(Project).c_str(), 10));
        EXPECT_EQ(NestedOutline, Outline(&file)) << "an open file doesn't need its path any more";
    }
    EXPECT_EQ(before, Q_MemoryLive("project file"));
}

}  // namespace
