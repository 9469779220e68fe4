#include "services/chunkfile/file_private.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

namespace {

class Descriptor {
public:
    explicit Descriptor(int number) noexcept : number_(number) {}
    ~Descriptor()
    {
        if (number_ >= 0) ::close(number_);
    }
    Descriptor(Descriptor const&) = delete;
    Descriptor& operator=(Descriptor const&) = delete;
    int Number() const noexcept { return number_; }

private:
    int number_;
};

// Bytes read, fewer than `size` where the file ends, or -1.
ssize_t ReadFully(int descriptor, unsigned char* bytes, std::size_t size) noexcept
{
    std::size_t done = 0;
    while (done < size) {
        ssize_t const count = ::read(descriptor, bytes + done, size - done);
        if (count < 0 && errno == EINTR) continue;
        if (count < 0) return -1;
        if (count == 0) break;
        done += static_cast<std::size_t>(count);
    }
    return static_cast<ssize_t>(done);
}

}  // namespace

int CKFp_LoadFile(char const* path, CKFp_Failure& failure, CKFp_Block* block, std::size_t* size)
{
    // Without waiting: what isn't a regular file, such as a pipe, is refused below.
    Descriptor const file(::open(path, O_RDONLY | O_CLOEXEC | O_NONBLOCK));
    if (file.Number() < 0) return failure.SetIo(errno, 0, "open", path);
    struct stat status;
    if (::fstat(file.Number(), &status) != 0) return failure.SetIo(errno, 0, "open", path);
    if (!S_ISREG(status.st_mode)) return failure.SetIo(S_ISDIR(status.st_mode) ? EISDIR : EINVAL, 0, "open", path);
    if (status.st_size > std::int64_t{UINT32_MAX})
        return failure.Set(CKF_Err_TooBig, 0, "\"%s\" is bigger than a project file can be", path);
    // A file of another kind isn't loaded to find that out.
    unsigned char id[4] = {};
    if (::pread(file.Number(), id, sizeof id, 0) < 0) return failure.SetIo(errno, 0, "read", path);
    if (CKFp_Get32(id) != static_cast<std::uint32_t>(CKFp_FormId))
        return failure.Set(CKF_Err_NotAChunkFile, 0, "\"%s\" isn't a project file", path);

    std::size_t const bytes = static_cast<std::size_t>(status.st_size);
    block->reset(static_cast<unsigned char*>(Q_AllocatePtr(CKFp_AllocationId, "project file", bytes)));
    if (!*block) return failure.Set(Q_Err_OutOfMemory, 0, "not enough memory to open \"%s\"", path);
    ssize_t const read = ReadFully(file.Number(), block->get(), bytes);
    if (read < 0) return failure.SetIo(errno, 0, "read", path);
    *size = static_cast<std::size_t>(read);
    return 0;
}
