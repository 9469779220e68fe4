// Files that are replaced whole: whoever reads the target, and whoever comes after a crash, finds the old file or the
// new one, and never a piece of one. Project files are written this way, and so should everything be that a host or a
// command writes for a user.
//
//     CKF_FileWriter file;
//     file.Create(path);                                     // a failure is remembered, so that looking at
//     file.Append(text.data(), text.size());                 // what Commit answers is enough
//     if (file.Commit() != 0) ... file.LastErrorText() ...
//
// What is written goes into a temporary file ".<target>.saving-<process>-<number>" beside the target. Commit flushes it
// to disk, renames it over the target and flushes the folder.
//
// Links    A symbolic link stays a link. What it points to is replaced, or made where it isn't there yet.
// Rights   The file keeps the target's access rights, owner and group. An owner or group that the process may not give
//          is replaced by its own; what such a group may do is then no more than what everybody may. Until Commit the
//          bytes are the process's own (0600). A new file gets what the process gives new files (its umask).
// Left     A failure or a destroyed writer removes the temporary file. That of a process that was killed is removed by
// behind   the next writer to the same target, whichever process that is: its lock tells whether somebody still writes.
// Signals  are the program's business. One that ends on SIGINT and its like calls CKF_RemoveTemporariesOnSignals() at its
//          start, or CKF_RemoveTemporaries() in a handler of its own.
// Threads  One writer is used by one thread at a time; any number of them may work at once, also on one target: the last
//          Commit wins.
#pragma once

#include "frame/services/export.h"

#include <cstddef>
#include <cstdint>
#include <memory>

// Each call that a file makes of the operating system, and each piece of data that goes into the file.
enum class CKF_IoCall {
    Append,      // a piece of data goes into the file, or into its buffer
    Create,      // the temporary file is made
    Write,       // the buffer goes to disk, or bytes behind it are put right
    Sync,        // the temporary file is flushed to disk
    Close,       // ... and closed
    Rename,      // ... and takes its target's place
    SyncFolder,  // the folder is flushed to disk
};

// Asked before each such call. An errno value makes the call fail with it, unperformed; 0 lets it happen. This is how
// tests make the n-th write fail, or a disk run full.
class CKF_IoHook {
public:
    virtual ~CKF_IoHook() = default;
    [[nodiscard]] virtual int Before(CKF_IoCall call, std::size_t bytes) noexcept = 0;
};

// What may stand at the target's place.
enum class CKF_Target {
    File,          // a regular file, or nothing; all else is refused
    FileOrStream,  // a pipe or a device as well, which is written to directly, in order: nothing is replaced there
};

// Answers are 0 or an errno value. The first failure stays, removes the temporary file, and is the answer of all that
// follows until the next Create: only Commit's must be looked at. Nothing throws; ENOMEM is out of memory.
class KFS_SERVICE_API CKF_FileWriter {
public:
    // A hook that isn't null must outlive the writer.
    explicit CKF_FileWriter(CKF_IoHook* hook = nullptr) noexcept;
    // Discards what was not committed.
    ~CKF_FileWriter();
    CKF_FileWriter(CKF_FileWriter const&) = delete;
    CKF_FileWriter& operator=(CKF_FileWriter const&) = delete;

    // Begins a file; what was begun before is discarded.
    int Create(char const* path, CKF_Target target = CKF_Target::File) noexcept;
    // Puts bytes at the end, through a buffer.
    int Append(void const* bytes, std::size_t size) noexcept;
    // Replaces bytes, all of which came with one call of Append. ESPIPE on a stream.
    int Patch(std::uint64_t offset, void const* bytes, std::size_t size) noexcept;
    // Makes the target the new file. The one failure behind which it is already that: a folder that can't be flushed, so
    // that the new file may not survive a power cut.
    [[nodiscard]] int Commit() noexcept;
    void Discard() noexcept;

    // Bytes appended so far.
    std::uint64_t Size() const noexcept;
    // A sentence for the user about the first failure, with the file's name: "can't write "a.svg": No space left on
    // device". "" if there was none. Valid until the next Create.
    char const* LastErrorText() const noexcept;

private:
    struct Impl;
    struct Failure {
        int error = 0;
        char text[512] = "";
    };
    template <class Work>
    [[nodiscard]] int Run(Work work) noexcept;

    std::unique_ptr<Impl> impl_;  // while a file is being written
    CKF_IoHook* hook_;
    std::uint64_t size_ = 0;
    Failure failure_;
};

// Removes the temporary files that this process is writing; their writers fail when they commit. May be called in a
// signal handler. Files beyond the first 32 that are written at once stay for the next save to their targets.
KFS_SERVICE_API void CKF_RemoveTemporaries() noexcept;
// For a program's start: signals that end the process (SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGXFSZ) remove the temporary
// files first. Signals that the program handles or ignores at that time stay as they are.
KFS_SERVICE_API void CKF_RemoveTemporariesOnSignals() noexcept;
