// Where the bytes of a file that is written go.
#pragma once

#include "frame/services/chunkfile.h"
#include "frame/services/filewriter.h"
#include "frame/services/memory.h"
#include "services/chunkfile/failure_private.h"

#include <vector>

using CKFp_Buffer = std::vector<unsigned char, Q_Allocator<unsigned char>>;

// All operations return 0 or a code, and have recorded the failure.
class CKFp_Sink : public Q_MemTrackedObject {
public:
    explicit CKFp_Sink(CKFp_Failure& failure) noexcept : failure_(failure) {}
    // What was not committed leaves nothing behind.
    virtual ~CKFp_Sink() = default;
    CKFp_Sink(CKFp_Sink const&) = delete;
    CKFp_Sink& operator=(CKFp_Sink const&) = delete;

    // Puts bytes at the end. Bytes of one call can later be replaced together.
    [[nodiscard]] int Append(void const* bytes, std::size_t size);
    // Replaces bytes, all of which came with one call of Append.
    [[nodiscard]] virtual int Patch(std::uint64_t offset, void const* bytes, std::size_t size) = 0;
    // Makes the file what it is to be.
    [[nodiscard]] virtual int Commit() = 0;

    std::uint64_t Size() const noexcept { return size_; }

protected:
    [[nodiscard]] virtual int DoAppend(void const* bytes, std::size_t size) = 0;
    CKFp_Failure& Failure() noexcept { return failure_; }

private:
    CKFp_Failure& failure_;
    std::uint64_t size_ = 0;
};

// Into memory. The bytes are handed over by Commit.
class CKFp_MemorySink : public CKFp_Sink {
public:
    CKFp_MemorySink(CKF_IoHook* hook, CKFp_Failure& failure, CKFp_Buffer& committed) noexcept
        : CKFp_Sink(failure),
          hook_(hook),
          committed_(committed)
    {}

    int Patch(std::uint64_t offset, void const* bytes, std::size_t size) override;
    int Commit() override;

private:
    int DoAppend(void const* bytes, std::size_t size) override;

    CKF_IoHook* hook_;
    CKFp_Buffer bytes_;
    CKFp_Buffer& committed_;
};

// Into a file on disk.
class CKFp_DiskSink : public CKFp_Sink {
public:
    CKFp_DiskSink(CKF_IoHook* hook, CKFp_Failure& failure) noexcept : CKFp_Sink(failure), file_(hook) {}

    [[nodiscard]] int Create(char const* path) { return Told(file_.Create(path)); }
    int Patch(std::uint64_t offset, void const* bytes, std::size_t size) override
    {
        return Told(file_.Patch(offset, bytes, size));
    }
    int Commit() override { return Told(file_.Commit()); }

private:
    int DoAppend(void const* bytes, std::size_t size) override { return Told(file_.Append(bytes, size)); }
    [[nodiscard]] int Told(int error) noexcept;

    CKF_FileWriter file_;
};
