#include "services/chunkfile/sink_private.h"

#include <cerrno>
#include <cstring>

int CKFp_Sink::Append(void const* bytes, std::size_t size)
{
    if (int const code = DoAppend(bytes, size)) return code;
    size_ += size;
    return 0;
}

int CKFp_MemorySink::DoAppend(void const* bytes, std::size_t size)
{
    if (int const error = hook_ ? hook_->Before(CKF_IoCall::Append, size) : 0)
        return Failure().SetIo(error, Size(), "write", "memory");
    unsigned char const* const first = static_cast<unsigned char const*>(bytes);
    try {
        bytes_.insert(bytes_.end(), first, first + size);
        return 0;
    } catch (std::exception const&) {
        return Failure().SetOutOfMemory(Size());
    }
}

int CKFp_MemorySink::Patch(std::uint64_t offset, void const* bytes, std::size_t size)
{
    std::memcpy(bytes_.data() + offset, bytes, size);
    return 0;
}

int CKFp_MemorySink::Commit()
{
    committed_ = std::move(bytes_);
    return 0;
}

int CKFp_DiskSink::Told(int error) noexcept
{
    if (error == 0) return 0;
    if (error == ENOMEM) return Failure().SetOutOfMemory(Size());
    return Failure().Set(CKF_Err_Io, Size(), "%s", file_.LastErrorText());
}
