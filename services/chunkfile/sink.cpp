#include "services/chunkfile/sink_private.h"

#include "services/utility/growptr_private.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <cstring>

bool CKFp_Buffer::Grow(std::size_t size) noexcept
{
    constexpr std::size_t least = 4096;
    if (size > SIZE_MAX / 4 - size_) return false;
    std::size_t const capacity = std::max({least, size_ + size, size_ + size_ / 2});
    void* const grown =
        bytes_ ? Q_GrowPtr(bytes_.get(), capacity) : Q_AllocatePtr(0x190000, "chunk file in memory", capacity);
    if (!grown) return false;
    static_cast<void>(bytes_.release());
    bytes_.reset(static_cast<unsigned char*>(grown));
    capacity_ = capacity;
    return true;
}

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
    return bytes_.Append(bytes, size) ? 0 : Failure().SetOutOfMemory(Size());
}

int CKFp_MemorySink::Patch(std::uint64_t offset, void const* bytes, std::size_t size)
{
    std::memcpy(bytes_.Data() + offset, bytes, size);
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
