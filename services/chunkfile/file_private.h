#pragma once

#include "services/chunkfile/reader_private.h"
#include "services/chunkfile/writer_private.h"

#include <memory>

inline constexpr int CKFp_AllocationId = 0x190000;

// Reads a whole regular file into one block. 0 or a recorded failure.
[[nodiscard]] int CKFp_LoadFile(char const* path, CKFp_Failure& failure, CKFp_Block* block, std::size_t* size);

struct CKF_File::Impl : Q_MemTrackedObject {
    CKFp_Failure failure;
    CKFp_Block loaded;      // what the reader reads, unless it is borrowed
    CKFp_Buffer committed;  // what was written into memory
    std::unique_ptr<CKFp_Reader> reader;
    std::unique_ptr<CKFp_Writer> writer;
};

struct CKFp_Access {
    static CKF_File::Impl& ImplOf(CKF_File& file) noexcept { return *file.impl_; }
};

// Runs `work` on the file's reader or writer, unless the file has failed. Out of memory is a failure like any other.
template <class Worker, class Work>
[[nodiscard]] int CKFp_WithWorker(CKF_File* file, std::unique_ptr<Worker> CKF_File::Impl::*worker,
                                  char const* direction, Work work)
{
    if (!file) return CKF_Err_BadArgument;
    CKF_File::Impl& impl = CKFp_Access::ImplOf(*file);
    if (int const code = impl.failure.Code()) return code;
    if (!(impl.*worker)) return impl.failure.Set(CKF_Err_NotOpen, 0, "the file isn't open for %s", direction);
    try {
        return work(*(impl.*worker));
    } catch (std::bad_alloc const&) {
        return impl.failure.SetOutOfMemory(0);
    }
}

template <class Work>
[[nodiscard]] int CKFp_WithReader(CKF_File* file, Work work)
{
    return CKFp_WithWorker(file, &CKF_File::Impl::reader, "reading", work);
}

template <class Work>
[[nodiscard]] int CKFp_WithWriter(CKF_File* file, Work work)
{
    return CKFp_WithWorker(file, &CKF_File::Impl::writer, "writing", work);
}

// For failures that are found on the way to the reader or writer. The file must be there.
inline CKFp_Failure& CKFp_FailureOf(CKF_File* file) noexcept
{
    return CKFp_Access::ImplOf(*file).failure;
}
