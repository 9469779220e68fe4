// Names, locks and removal of temporary files: apart from the writing, since this is what other processes and signal
// handlers take part in.
#include "services/chunkfile/temporaryfile_private.h"

#include "frame/services/filewriter.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string_view>
#include <utility>

namespace {

// The names of the temporary files of this process, for a signal handler. Whoever takes a name out, the handler or the
// file, owns it from then on.
constinit std::array<std::atomic<char*>, 32> S_Names{};
static_assert(std::atomic<char*>::is_always_lock_free, "a signal handler takes no lock");

bool Remember(char* name) noexcept
{
    for (std::atomic<char*>& slot : S_Names) {
        char* empty = nullptr;
        if (slot.compare_exchange_strong(empty, name)) return true;
    }
    return false;
}

// False where a handler has taken it.
bool TakeBack(char* name) noexcept
{
    for (std::atomic<char*>& slot : S_Names) {
        char* held = name;
        if (slot.compare_exchange_strong(held, nullptr)) return true;
    }
    return false;
}

extern "C" void RemoveAndDie(int signal)
{
    CKF_RemoveTemporaries();
    std::raise(signal);  // which the system handles by now, once this returns
}

constexpr std::string_view Mark = ".saving-";

// ".<target>.saving-": what all temporary files of one target begin with. A long name is cut, not inside a character, so
// that the rest has room.
std::string PrefixOf(std::string const& target)
{
    constexpr std::size_t longest = 200;
    std::string name = target.substr(target.rfind('/') + 1);
    if (name.size() > longest) {
        std::size_t end = longest;
        while (end > 0 && (static_cast<unsigned char>(name[end]) & 0xC0) == 0x80) --end;
        name.resize(end);
    }
    return '.' + name + std::string(Mark);
}

// "<process>-<number>"
bool IsSuffix(std::string_view text)
{
    std::size_t const dash = text.find('-');
    auto const isNumber = [](std::string_view digits) {
        return !digits.empty() && digits.find_first_not_of("0123456789") == digits.npos;
    };
    return dash != text.npos && isNumber(text.substr(0, dash)) && isNumber(text.substr(dash + 1));
}

// A file that nobody holds a lock on has lost its process. Where a file system knows no locks, files stay.
void RemoveIfAbandoned(int folder, char const* name)
{
    int const file = ::openat(folder, name, O_RDWR | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    if (file < 0) return;
    struct stat status;
    if (::fstat(file, &status) == 0 && S_ISREG(status.st_mode) && ::flock(file, LOCK_EX | LOCK_NB) == 0)
        ::unlinkat(folder, name, 0);
    ::close(file);
}

void RemoveAbandoned(std::string const& folder, std::string const& prefix)
{
    std::unique_ptr<DIR, int (*)(DIR*)> const entries(::opendir(folder.c_str()), ::closedir);
    if (!entries) return;
    while (dirent const* const entry = ::readdir(entries.get())) {
        std::string_view const name = entry->d_name;
        if (name.starts_with(prefix) && IsSuffix(name.substr(prefix.size())))
            RemoveIfAbandoned(::dirfd(entries.get()), entry->d_name);
    }
}

}  // namespace

std::string CKFp_FolderOf(std::string const& path)
{
    std::size_t const slash = path.rfind('/');
    if (slash == std::string::npos) return ".";
    return slash == 0 ? "/" : path.substr(0, slash);
}

int CKFp_FollowLinks(std::string* path)
{
    constexpr int most = 40;  // as the system does
    for (int links = 0;; ++links) {
        char to[PATH_MAX];
        ssize_t const size = ::readlink(path->c_str(), to, sizeof to);
        if (size < 0) return errno == EINVAL || errno == ENOENT ? 0 : errno;  // no link, or nothing at all
        if (links == most) return ELOOP;
        std::string const next(to, static_cast<std::size_t>(size));
        *path = next.starts_with('/') ? next : CKFp_FolderOf(*path) + '/' + next;
    }
}

CKFp_TemporaryFile::~CKFp_TemporaryFile()
{
    if (name_) ::unlink(name_);
    DropName();
    if (descriptor_ >= 0) ::close(descriptor_);
    if (lock_ >= 0) ::close(lock_);
}

void CKFp_TemporaryFile::DropName() noexcept
{
    if (!remembered_ || TakeBack(name_)) std::free(name_);
    name_ = nullptr;
    remembered_ = false;
}

int CKFp_TemporaryFile::Create(std::string const& target, mode_t mode)
{
    static std::atomic<unsigned> counter{0};
    std::string const folder = CKFp_FolderOf(target);
    std::string const prefix = PrefixOf(target);
    RemoveAbandoned(folder, prefix);
    std::string const process = folder + '/' + prefix + std::to_string(::getpid()) + '-';
    constexpr int attempts = 1000;  // another machine or container may have a process of this number
    int error = EEXIST;
    for (int i = 0; i < attempts && error == EEXIST; ++i)
        error = TryName(process + std::to_string(counter.fetch_add(1)), mode);
    return error;
}

int CKFp_TemporaryFile::TryName(std::string const& name, mode_t mode)
{
    do descriptor_ = ::open(name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, mode);
    while (descriptor_ < 0 && errno == EINTR);
    if (descriptor_ < 0) return errno;
    name_ = ::strdup(name.c_str());
    if (!name_) {
        ::unlink(name.c_str());
        return ENOMEM;
    }
    remembered_ = Remember(name_);
    // Until it was locked, another save to the same target may have taken it for abandoned and removed it.
    struct stat status;
    if (::flock(descriptor_, LOCK_EX) == 0 && ::fstat(descriptor_, &status) == 0 && status.st_nlink == 0) {
        DropName();
        ::close(std::exchange(descriptor_, -1));
        return EEXIST;
    }
    lock_ = ::fcntl(descriptor_, F_DUPFD_CLOEXEC, 0);
    return lock_ < 0 ? errno : 0;
}

int CKFp_TemporaryFile::Close() noexcept
{
    // After an error the descriptor is gone as well.
    return ::close(std::exchange(descriptor_, -1)) != 0 ? errno : 0;
}

int CKFp_TemporaryFile::Rename(std::string const& target) noexcept
{
    if (::rename(name_, target.c_str()) != 0) return errno;
    DropName();
    return 0;
}

void CKF_RemoveTemporaries() noexcept
{
    int const error = errno;
    for (std::atomic<char*>& slot : S_Names)
        if (char const* const name = slot.exchange(nullptr)) ::unlink(name);
    errno = error;
}

void CKF_RemoveTemporariesOnSignals() noexcept
{
    for (int const signal : {SIGINT, SIGTERM, SIGHUP, SIGQUIT, SIGXFSZ}) {
        struct sigaction action;
        if (::sigaction(signal, nullptr, &action) != 0 || action.sa_handler != SIG_DFL) continue;
        action = {};
        action.sa_handler = RemoveAndDie;
        action.sa_flags = SA_RESETHAND;
        ::sigaction(signal, &action, nullptr);
    }
}
