// Where the bytes of a file that is written go.
#pragma once

#include "frame/services/chunkfile.h"
#include "frame/services/memory.h"
#include "services/chunkfile/failure_private.h"

#include <string>
#include <vector>

using CKFp_Buffer = std::vector<unsigned char, Q_Allocator<unsigned char>>;

// All operations return 0 or a code, and have recorded the failure.
class CKFp_Sink : public Q_MemTrackedObject {
public:
    CKFp_Sink(CKF_IoHook* hook, CKFp_Failure& failure) noexcept : hook_(hook), failure_(failure) {}
    // What was not committed leaves nothing behind.
    virtual ~CKFp_Sink() = default;
    CKFp_Sink(CKFp_Sink const&) = delete;
    CKFp_Sink& operator=(CKFp_Sink const&) = delete;

    // Puts bytes at the end. Bytes of one call can later be replaced together.
    int Append(void const* bytes, std::size_t size);
    // Replaces bytes, all of which came with one call of Append.
    virtual int Patch(std::uint64_t offset, void const* bytes, std::size_t size) = 0;
    // Makes the file what it is to be.
    virtual int Commit() = 0;

    std::uint64_t Size() const noexcept { return size_; }

protected:
    virtual int DoAppend(void const* bytes, std::size_t size) = 0;
    // What a message calls the file.
    virtual char const* Name() const noexcept = 0;
    // An errno value with which the call has to fail, or 0.
    int Refused(CKF_IoCall call, std::size_t bytes) const noexcept { return hook_ ? hook_->Before(call, bytes) : 0; }
    CKFp_Failure& Failure() noexcept { return failure_; }

private:
    CKF_IoHook* hook_;
    CKFp_Failure& failure_;
    std::uint64_t size_ = 0;
};

// Into memory. The bytes are handed over by Commit.
class CKFp_MemorySink : public CKFp_Sink {
public:
    CKFp_MemorySink(CKF_IoHook* hook, CKFp_Failure& failure, CKFp_Buffer& committed) noexcept
        : CKFp_Sink(hook, failure),
          committed_(committed)
    {}

    int Patch(std::uint64_t offset, void const* bytes, std::size_t size) override;
    int Commit() override;

private:
    int DoAppend(void const* bytes, std::size_t size) override;
    char const* Name() const noexcept override { return "memory"; }

    CKFp_Buffer bytes_;
    CKFp_Buffer& committed_;
};

// Into a temporary file in the target's folder, which takes the target's place at Commit.
class CKFp_DiskSink : public CKFp_Sink {
public:
    using CKFp_Sink::CKFp_Sink;
    ~CKFp_DiskSink() override;

    int Create(char const* path);
    int Patch(std::uint64_t offset, void const* bytes, std::size_t size) override;
    int Commit() override;

private:
    int DoAppend(void const* bytes, std::size_t size) override;
    char const* Name() const noexcept override { return target_.c_str(); }

    int Fail(int error, char const* what, std::string const& path) noexcept;
    int CreateTemporary(unsigned mode);
    int Flush();
    int WriteAt(std::uint64_t offset, void const* bytes, std::size_t size);
    int SyncAndClose();
    int SyncFolder();

    std::string target_;
    std::string folder_;
    std::string temporary_;  // empty where there is none to remove
    int descriptor_ = -1;
    std::uint64_t flushed_ = 0;  // bytes on their way to the disk; what follows is in the buffer
    CKFp_Buffer buffer_;
};
