#include "services/chunkfile/sink_private.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <utility>

namespace {

constexpr std::size_t BufferSize = 64 * 1024;

struct FreeMemory {
    void operator()(char* text) const noexcept { std::free(text); }
};

// Repeats what a signal interrupted.
template <class Call>
auto Uninterrupted(Call call)
{
    for (;;) {
        auto const result = call();
        if (result != -1 || errno != EINTR) return result;
    }
}

std::string FolderOf(std::string const& path)
{
    std::size_t const slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

// A name that no other file of this process has had. One left by a dead process is passed over by O_EXCL.
std::string TemporaryName(std::string const& folder)
{
    static std::atomic<unsigned> counter{0};
    char name[64];
    std::snprintf(name, sizeof name, "/.saving-%ld-%u.tmp", static_cast<long>(::getpid()), counter.fetch_add(1));
    return folder + name;
}

}  // namespace

CKFp_DiskSink::~CKFp_DiskSink()
{
    if (descriptor_ >= 0) ::close(descriptor_);
    if (!temporary_.empty()) ::unlink(temporary_.c_str());
}

int CKFp_DiskSink::Fail(int error, char const* what, std::string const& path) noexcept
{
    return Failure().SetIo(error, Size(), what, path.c_str());
}

int CKFp_DiskSink::Create(char const* path)
{
    target_ = path;
    if (target_.empty() || target_.back() == '/') return Fail(ENOENT, "write", target_);
    buffer_.reserve(BufferSize);
    unsigned mode = 0;
    struct stat present;
    if (::stat(path, &present) == 0) {
        if (!S_ISREG(present.st_mode)) return Fail(S_ISDIR(present.st_mode) ? EISDIR : EINVAL, "replace", target_);
        // A link stays a link: what it points to is replaced.
        std::unique_ptr<char, FreeMemory> const real(::realpath(path, nullptr));
        if (!real) return Fail(errno, "find", target_);
        target_ = real.get();
        mode = present.st_mode & 07777;
    } else if (errno != ENOENT) {
        return Fail(errno, "find", target_);
    }
    folder_ = FolderOf(target_);
    return CreateTemporary(mode);
}

// `mode` is 0 for a new file, which gets what the process gives new files.
int CKFp_DiskSink::CreateTemporary(unsigned mode)
{
    if (int const error = Refused(CKF_IoCall::Create, 0)) return Fail(error, "write beside", target_);
    constexpr int attempts = 1000;
    for (int i = 0; i < attempts && descriptor_ < 0; ++i) {
        std::string name = TemporaryName(folder_);
        descriptor_ = Uninterrupted([&] { return ::open(name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0666); });
        if (descriptor_ >= 0)
            temporary_ = std::move(name);
        else if (errno != EEXIST)
            break;
    }
    if (descriptor_ < 0) return Fail(errno, "write beside", target_);
    // Where the rights can't be kept, as on some network disks, saving goes on without them.
    if (mode != 0 && ::fchmod(descriptor_, mode) != 0) errno = 0;
    return 0;
}

int CKFp_DiskSink::WriteAt(std::uint64_t offset, void const* bytes, std::size_t size)
{
    if (int const error = Refused(CKF_IoCall::Write, size)) return Fail(error, "write", target_);
    unsigned char const* from = static_cast<unsigned char const*>(bytes);
    while (size > 0) {
        ssize_t const done =
            Uninterrupted([&] { return ::pwrite(descriptor_, from, size, static_cast<off_t>(offset)); });
        if (done <= 0) return Fail(done < 0 ? errno : ENOSPC, "write", target_);
        from += done;
        size -= static_cast<std::size_t>(done);
        offset += static_cast<std::uint64_t>(done);
    }
    return 0;
}

int CKFp_DiskSink::Flush()
{
    if (buffer_.empty()) return 0;
    if (int const code = WriteAt(flushed_, buffer_.data(), buffer_.size())) return code;
    flushed_ += buffer_.size();
    buffer_.clear();
    return 0;
}

// Bytes of one call stay together, in the buffer or behind it, which is what Patch relies on.
int CKFp_DiskSink::DoAppend(void const* bytes, std::size_t size)
{
    if (size > BufferSize - buffer_.size())
        if (int const code = Flush()) return code;
    if (size > BufferSize) {
        if (int const code = WriteAt(flushed_, bytes, size)) return code;
        flushed_ += size;
        return 0;
    }
    unsigned char const* const first = static_cast<unsigned char const*>(bytes);
    buffer_.insert(buffer_.end(), first, first + size);  // the room is there
    return 0;
}

int CKFp_DiskSink::Patch(std::uint64_t offset, void const* bytes, std::size_t size)
{
    if (offset < flushed_) return WriteAt(offset, bytes, size);
    std::memcpy(buffer_.data() + (offset - flushed_), bytes, size);
    return 0;
}

int CKFp_DiskSink::SyncAndClose()
{
    if (int const error = Refused(CKF_IoCall::Sync, 0)) return Fail(error, "flush", target_);
    if (Uninterrupted([&] { return ::fsync(descriptor_); }) != 0) return Fail(errno, "flush", target_);
    struct stat written;
    if (::fstat(descriptor_, &written) != 0) return Fail(errno, "check", target_);
    if (static_cast<std::uint64_t>(written.st_size) != Size()) return Fail(EIO, "check", target_);
    if (int const error = Refused(CKF_IoCall::Close, 0)) return Fail(error, "close", target_);
    // After an error the descriptor is gone as well.
    if (::close(std::exchange(descriptor_, -1)) != 0) return Fail(errno, "close", target_);
    return 0;
}

int CKFp_DiskSink::SyncFolder()
{
    if (int const error = Refused(CKF_IoCall::SyncFolder, 0)) return Fail(error, "flush the folder", folder_);
    int const folder = Uninterrupted([&] { return ::open(folder_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); });
    if (folder < 0) return errno == EACCES ? 0 : Fail(errno, "open the folder", folder_);
    int const result = Uninterrupted([&] { return ::fsync(folder); });
    int const error = result != 0 ? errno : 0;
    ::close(folder);
    // Some file systems can't flush a folder and say so with EINVAL; a folder that may be written to but not listed
    // can't be opened. Neither is a failed save.
    return error == 0 || error == EINVAL ? 0 : Fail(error, "flush the folder", folder_);
}

int CKFp_DiskSink::Commit()
{
    if (int const code = Flush()) return code;
    if (int const code = SyncAndClose()) return code;
    if (int const error = Refused(CKF_IoCall::Rename, 0)) return Fail(error, "replace", target_);
    if (::rename(temporary_.c_str(), target_.c_str()) != 0) return Fail(errno, "replace", target_);
    temporary_.clear();
    return SyncFolder();
}
