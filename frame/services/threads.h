// Locks and the identity of threads.
#pragma once

#include "frame/services/export.h"

#include <cstdint>
#include <mutex>

namespace hearth::threads {

// A mutex that its owner may lock again. The names are for people who read a debugger; they must outlive the mutex.
class RecursiveMutex {
public:
    explicit RecursiveMutex(char const* name = nullptr) noexcept : name_(name) {}
    RecursiveMutex(RecursiveMutex const&) = delete;
    RecursiveMutex& operator=(RecursiveMutex const&) = delete;

    // Waits until the calling thread owns the mutex. `place` names who locks, or is null.
    void Lock(char const* place = nullptr)
    {
        mutex_.lock();
        place_ = place;
    }
    // Undoes one Lock of the calling thread.
    void Unlock() noexcept { mutex_.unlock(); }

    char const* GetName() const noexcept { return name_; }

private:
    std::recursive_mutex mutex_;
    char const* name_;
    char const* place_ = nullptr;  // of the last Lock
};

// Locks for a scope.
class ScRecursiveLock {
public:
    explicit ScRecursiveLock(RecursiveMutex& mutex, char const* place = nullptr) : mutex_(mutex) { mutex_.Lock(place); }
    ScRecursiveLock(ScRecursiveLock const&) = delete;
    ScRecursiveLock& operator=(ScRecursiveLock const&) = delete;
    ~ScRecursiveLock() { mutex_.Unlock(); }

private:
    RecursiveMutex& mutex_;
};

// A number that no other thread of the process has or had. Never 0.
KFS_SERVICE_API std::uint64_t GetCurrentThreadID() noexcept;

// Whether the calling thread is the main thread: the one that loaded this library, unless the host names another.
KFS_SERVICE_API bool CurrentThreadIsMainThread() noexcept;
KFS_SERVICE_API void SetCurrentThreadAsMain() noexcept;

}  // namespace hearth::threads
