#include "frame/services/threads.h"

#include <atomic>

namespace hearth::threads {

namespace {

std::uint64_t NextThreadID() noexcept
{
    static std::atomic<std::uint64_t> last{0};
    return last.fetch_add(1, std::memory_order_relaxed) + 1;
}

// Loading the library takes the loading thread's number.
std::atomic<std::uint64_t> mainThread{GetCurrentThreadID()};

}  // namespace

std::uint64_t GetCurrentThreadID() noexcept
{
    thread_local std::uint64_t const id = NextThreadID();
    return id;
}

bool CurrentThreadIsMainThread() noexcept
{
    return mainThread.load(std::memory_order_relaxed) == GetCurrentThreadID();
}

void SetCurrentThreadAsMain() noexcept
{
    mainThread.store(GetCurrentThreadID(), std::memory_order_relaxed);
}

}  // namespace hearth::threads
