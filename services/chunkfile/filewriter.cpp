#include "frame/services/filewriter.h"

#include "frame/services/memory.h"
#include "services/chunkfile/failure_private.h"
#include "services/chunkfile/temporaryfile_private.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <optional>
#include <utility>
#include <vector>

namespace {

constexpr std::size_t BufferSize = 64 * 1024;

// What went wrong, for the sentence "can't <what> "<path>": <the system's text>".
struct Problem {
    int error;
    char const* what;
    std::string path;
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

// The rights that a group has in a mode, cut to what everybody has.
mode_t WithoutGroup(mode_t mode)
{
    return mode & ~(S_ISGID | (S_IRWXG & ~((mode & S_IRWXO) << 3)));
}

// Gives a file the owner and rights of another, or less. An errno value where it would be open to more than that one.
int KeepRights(int file, struct stat const& old)
{
    struct stat now;
    if (::fstat(file, &now) != 0) return errno;
    if (now.st_uid != old.st_uid || now.st_gid != old.st_gid) {
        if (::fchown(file, old.st_uid, old.st_gid) != 0 && ::fchown(file, static_cast<uid_t>(-1), old.st_gid) != 0)
            errno = 0;  // neither may be given away
        if (::fstat(file, &now) != 0) return errno;
    }
    mode_t mode = old.st_mode & 07777;
    if (now.st_uid != old.st_uid) mode &= ~static_cast<mode_t>(S_ISUID);
    if (now.st_gid != old.st_gid) mode = WithoutGroup(mode);
    int const error = ::fchmod(file, mode) == 0 ? 0 : errno;
    // Some network disks have rights of their own, which is no harm as long as they are no wider.
    if (::fstat(file, &now) != 0) return errno;
    return (now.st_mode & 07777 & ~mode) == 0 ? 0 : error ? error : EPERM;
}

}  // namespace

struct CKF_FileWriter::Impl : Q_MemTrackedObject {
    explicit Impl(CKF_IoHook* ioHook) noexcept : hook_(ioHook) {}
    ~Impl()
    {
        if (stream_ >= 0) ::close(stream_);
    }
    Impl(Impl const&) = delete;
    Impl& operator=(Impl const&) = delete;

    void Create(char const* path, CKF_Target kind);
    void Append(void const* bytes, std::size_t size);
    void Patch(std::uint64_t offset, void const* bytes, std::size_t size);
    void Commit();

private:
    [[noreturn]] void Fail(int error, char const* what) const { throw Problem{error, what, target_}; }
    void Check(int error, char const* what) const
    {
        if (error != 0) Fail(error, what);
    }
    void Ask(CKF_IoCall call, std::size_t bytes, char const* what) const
    {
        if (hook_) Check(hook_->Before(call, bytes), what);
    }
    bool IsStream() const noexcept { return stream_ >= 0; }
    void Flush();
    void WriteAt(std::uint64_t offset, void const* bytes, std::size_t size);
    void CheckSize();
    void SyncFolder();

    CKF_IoHook* const hook_;
    std::string target_;
    std::optional<struct stat> replaced_;  // what the target was
    CKFp_TemporaryFile temporary_;
    int stream_ = -1;            // a pipe or a device, instead of the temporary file
    std::uint64_t flushed_ = 0;  // bytes on their way to the disk; what follows is in the buffer
    std::vector<unsigned char, Q_Allocator<unsigned char>> buffer_;
};

void CKF_FileWriter::Impl::Create(char const* path, CKF_Target kind)
{
    target_ = path;
    if (target_.empty() || target_.back() == '/') Fail(ENOENT, "write");
    buffer_.reserve(BufferSize);
    struct stat present;
    if (::stat(path, &present) == 0) {
        bool const isFile = S_ISREG(present.st_mode);
        if (S_ISDIR(present.st_mode)) Fail(EISDIR, "replace");
        if (!isFile && kind == CKF_Target::File) Fail(EINVAL, "replace");
        if (!isFile) {
            Ask(CKF_IoCall::Create, 0, "write");
            stream_ = Uninterrupted([&] { return ::open(path, O_WRONLY | O_CLOEXEC | O_NOCTTY); });
            return Check(stream_ < 0 ? errno : 0, "write");
        }
        replaced_ = present;
    } else if (errno != ENOENT) {
        Fail(errno, "find");
    }
    Check(CKFp_FollowLinks(&target_), "find");
    Ask(CKF_IoCall::Create, 0, "write beside");
    Check(temporary_.Create(target_, replaced_ ? 0600 : 0666), "write beside");
}

void CKF_FileWriter::Impl::WriteAt(std::uint64_t offset, void const* bytes, std::size_t size)
{
    Ask(CKF_IoCall::Write, size, "write");
    unsigned char const* from = static_cast<unsigned char const*>(bytes);
    while (size > 0) {
        ssize_t const done = Uninterrupted([&] {
            return IsStream() ? ::write(stream_, from, size)
                              : ::pwrite(temporary_.Descriptor(), from, size, static_cast<off_t>(offset));
        });
        if (done <= 0) Fail(done < 0 ? errno : ENOSPC, "write");
        from += done;
        size -= static_cast<std::size_t>(done);
        offset += static_cast<std::uint64_t>(done);
    }
}

void CKF_FileWriter::Impl::Flush()
{
    if (buffer_.empty()) return;
    WriteAt(flushed_, buffer_.data(), buffer_.size());
    flushed_ += buffer_.size();
    buffer_.clear();
}

// Bytes of one call stay together, in the buffer or behind it, which is what Patch relies on.
void CKF_FileWriter::Impl::Append(void const* bytes, std::size_t size)
{
    Ask(CKF_IoCall::Append, size, "write");
    if (size > BufferSize - buffer_.size()) Flush();
    if (size > BufferSize) {
        WriteAt(flushed_, bytes, size);
        flushed_ += size;
        return;
    }
    unsigned char const* const first = static_cast<unsigned char const*>(bytes);
    buffer_.insert(buffer_.end(), first, first + size);  // the room is there
}

void CKF_FileWriter::Impl::Patch(std::uint64_t offset, void const* bytes, std::size_t size)
{
    if (offset >= flushed_)
        std::memcpy(buffer_.data() + (offset - flushed_), bytes, size);
    else if (IsStream())
        Fail(ESPIPE, "write");
    else
        WriteAt(offset, bytes, size);
}

// A disk that lost bytes without a word would be found out here.
void CKF_FileWriter::Impl::CheckSize()
{
    struct stat written;
    Check(::fstat(temporary_.Descriptor(), &written) == 0 ? 0 : errno, "check");
    if (static_cast<std::uint64_t>(written.st_size) != flushed_) Fail(EIO, "check");
}

void CKF_FileWriter::Impl::Commit()
{
    Flush();
    if (IsStream()) {
        Ask(CKF_IoCall::Close, 0, "close");
        return Check(::close(std::exchange(stream_, -1)) == 0 ? 0 : errno, "close");
    }
    if (replaced_) Check(KeepRights(temporary_.Descriptor(), *replaced_), "keep the access rights of");
    Ask(CKF_IoCall::Sync, 0, "flush");
    Check(Uninterrupted([&] { return ::fsync(temporary_.Descriptor()); }) == 0 ? 0 : errno, "flush");
    CheckSize();
    Ask(CKF_IoCall::Close, 0, "close");
    Check(temporary_.Close(), "close");
    Ask(CKF_IoCall::Rename, 0, "replace");
    Check(temporary_.Rename(target_), "replace");
    SyncFolder();
}

void CKF_FileWriter::Impl::SyncFolder()
{
    std::string const path = CKFp_FolderOf(target_);
    if (hook_)
        if (int const error = hook_->Before(CKF_IoCall::SyncFolder, 0)) throw Problem{error, "flush the folder", path};
    int const folder = Uninterrupted([&] { return ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC); });
    if (folder < 0 && errno != EACCES) throw Problem{errno, "open the folder", path};
    if (folder < 0) return;
    int const error = Uninterrupted([&] { return ::fsync(folder); }) != 0 ? errno : 0;
    ::close(folder);
    // Some file systems can't flush a folder and say so with EINVAL; a folder that may be written to but not listed
    // can't be opened. Neither is a failed save.
    if (error != 0 && error != EINVAL) throw Problem{error, "flush the folder", path};
}

CKF_FileWriter::CKF_FileWriter(CKF_IoHook* hook) noexcept : hook_(hook) {}

CKF_FileWriter::~CKF_FileWriter() = default;

// The one door between what fails inside and the answers.
template <class Work>
int CKF_FileWriter::Run(Work work) noexcept
{
    if (failure_.error != 0) return failure_.error;
    try {
        work();
    } catch (Problem const& problem) {
        failure_.error = problem.error;
        CKFp_DescribeIo(failure_.text, sizeof failure_.text, problem.error, problem.what, problem.path.c_str());
    } catch (std::bad_alloc const&) {
        failure_.error = ENOMEM;
        std::strcpy(failure_.text, "not enough memory to write the file");
    }
    if (failure_.error != 0) impl_.reset();
    return failure_.error;
}

int CKF_FileWriter::Create(char const* path, CKF_Target target) noexcept
{
    Discard();
    failure_ = {};
    size_ = 0;
    return Run([&] {
        impl_ = std::make_unique<Impl>(hook_);
        impl_->Create(path ? path : "", target);
    });
}

int CKF_FileWriter::Append(void const* bytes, std::size_t size) noexcept
{
    return Run([&] {
        if (!impl_) throw Problem{EBADF, "write", ""};
        impl_->Append(bytes, size);
        size_ += size;
    });
}

int CKF_FileWriter::Patch(std::uint64_t offset, void const* bytes, std::size_t size) noexcept
{
    return Run([&] {
        if (!impl_) throw Problem{EBADF, "write", ""};
        impl_->Patch(offset, bytes, size);
    });
}

int CKF_FileWriter::Commit() noexcept
{
    return Run([&] {
        if (!impl_) throw Problem{EBADF, "write", ""};
        impl_->Commit();
        impl_.reset();
    });
}

void CKF_FileWriter::Discard() noexcept
{
    impl_.reset();
}

std::uint64_t CKF_FileWriter::Size() const noexcept
{
    return size_;
}

char const* CKF_FileWriter::LastErrorText() const noexcept
{
    return failure_.text;
}
