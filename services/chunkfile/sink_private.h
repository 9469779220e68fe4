// Where the bytes of a file that is written go.
#pragma once

#include "frame/services/chunkfile.h"
#include "frame/services/filewriter.h"
#include "frame/services/memory.h"
#include "services/chunkfile/failure_private.h"

#include <cstring>
#include <memory>
#include <span>
#include <utility>

struct CKFp_FreePtr {
    void operator()(void* block) const noexcept { Q_FreePtr(block); }
};
using CKFp_Block = std::unique_ptr<unsigned char, CKFp_FreePtr>;

// Bytes that come piece by piece. It grows in place where it can: what is written into memory may be a big project, of
// which doubling would make copies.
class CKFp_Buffer {
public:
    CKFp_Buffer() = default;
    CKFp_Buffer(CKFp_Buffer&& other) noexcept { *this = std::move(other); }
    CKFp_Buffer& operator=(CKFp_Buffer&& other) noexcept
    {
        bytes_ = std::move(other.bytes_);
        size_ = std::exchange(other.size_, 0);
        capacity_ = std::exchange(other.capacity_, 0);
        return *this;
    }

    // False when memory is out; nothing has changed then.
    [[nodiscard]] bool Append(void const* bytes, std::size_t size) noexcept
    {
        if (size > capacity_ - size_ && !Grow(size)) return false;
        std::memcpy(bytes_.get() + size_, bytes, size);
        size_ += size;
        return true;
    }
    unsigned char* Data() noexcept { return bytes_.get(); }
    std::span<unsigned char const> Bytes() const noexcept { return {bytes_.get(), size_}; }

private:
    [[nodiscard]] bool Grow(std::size_t size) noexcept;

    CKFp_Block bytes_;
    std::size_t size_ = 0;
    std::size_t capacity_ = 0;
};

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
