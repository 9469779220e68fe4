// Memory that is counted by label, and can be made to run out.
//
// Every block and every tracked object is booked under a label, a text that says what the memory is for. Labels are
// compared by content and copied, so any text will do; the ids of an allocation say who asked, and aren't kept.
//
// Threads: any operation from any thread; a block may be freed on another thread than the one that allocated it.
#pragma once

#include "frame/services/export.h"

#include <cstddef>
#include <limits>
#include <new>
#include <type_traits>

// The code of a failed allocation, common to all services.
inline constexpr int Q_Err_OutOfMemory = 4;

// ---- blocks

// A block of `size` bytes, aligned to 16, zeroed in the second form; null when out of memory. Size 0 gives a block that
// may not be written to. Freed with Q_FreePtr, which takes null as well.
KFS_SERVICE_API void* Q_AllocatePtr(int id, char const* label, std::size_t size) noexcept;
KFS_SERVICE_API void* Q_AllocatePtrClear(int id, char const* label, std::size_t size) noexcept;
KFS_SERVICE_API void Q_FreePtr(void* block) noexcept;

// A handle: the address of a pointer to `size` zeroed bytes, aligned to 16; null when out of memory. Size 0 gives an
// empty handle. Freed with Q_FreeHandle, which takes null as well.
KFS_SERVICE_API char** Q_AllocateHandleClear(int id, char const* label, std::size_t size) noexcept;
KFS_SERVICE_API void Q_FreeHandle(void* handle) noexcept;
// The size that the handle was allocated with; 0 for null.
KFS_SERVICE_API std::size_t Q_GetHandleSize(char const* const* handle) noexcept;

// Books memory that was allocated elsewhere, under Q_AccountedElsewhere: 1 adds a block of `size` bytes, 0 takes one
// away.
inline constexpr char const* Q_AccountedElsewhere = "accounted elsewhere";
KFS_SERVICE_API void Q_AccountAllocationEx(std::size_t size, int add) noexcept;

// ---- counts

struct Q_MemoryCount {
    long long bytes = 0;  // as asked for, without what the allocator adds
    long long blocks = 0;
    bool operator==(Q_MemoryCount const&) const = default;
};

// What is live now under a label; under all labels together for null. A label that nobody used has nothing.
KFS_SERVICE_API Q_MemoryCount Q_MemoryLive(char const* label) noexcept;

// Calls `visit` for each label under which something is live, in no particular order. The label stays valid for ever.
using Q_MemoryVisitor = void (*)(void* context, char const* label, Q_MemoryCount const& count);
KFS_SERVICE_API void Q_ForEachMemoryLabel(Q_MemoryVisitor visit, void* context);

// ---- failure injection

// Makes the n-th allocation of the calling thread from now on fail, and only that one; 1 is the next. 0 disarms.
// Counted is everything of this header: blocks, handles, tracked objects, Q_Allocator and the memory of strings.
KFS_SERVICE_API void Q_FailAllocation(int n) noexcept;
// Whether that allocation was reached since the last call of Q_FailAllocation on this thread.
KFS_SERVICE_API bool Q_FailAllocationFired() noexcept;

// ---- objects and containers

// The base of classes whose objects show in the counts. Has no data and no virtual functions. Out of memory is a
// std::bad_alloc, as with any `new`. Classes that need an alignment above 16 can't be allocated this way.
class KFS_SERVICE_API Q_MemTrackedObject {
public:
    static constexpr char const* Label = "Q_MemTrackedObject";

    static void* operator new(std::size_t size) { return TrackedNew(size); }
    static void* operator new(std::size_t, void* place) noexcept { return place; }
    static void* operator new(std::size_t, std::align_val_t) = delete;
    static void operator delete(void* object) noexcept { TrackedDelete(object); }
    static void operator delete(void*, void*) noexcept {}

    // The same for objects of classes that have another base. TrackedNew throws std::bad_alloc.
    static void* TrackedNew(std::size_t size, char const* label = Label);
    static void TrackedDelete(void* object) noexcept;

protected:
    ~Q_MemTrackedObject() = default;
};

// The allocator of the library's containers. Throws std::bad_alloc.
template <class T>
class Q_Allocator {
public:
    using value_type = T;
    static constexpr char const* Label = "Q_Allocator";

    Q_Allocator() noexcept = default;
    template <class U>
    Q_Allocator(Q_Allocator<U> const&) noexcept
    {}

    T* allocate(std::size_t count)
    {
        static_assert(alignof(T) <= 16);
        if (count > std::numeric_limits<std::size_t>::max() / sizeof(T)) throw std::bad_array_new_length();
        if (void* const block = Q_AllocatePtr(0, Label, count * sizeof(T))) return static_cast<T*>(block);
        throw std::bad_alloc();
    }
    void deallocate(T* block, std::size_t) noexcept { Q_FreePtr(block); }

    template <class U>
    bool operator==(Q_Allocator<U> const&) const noexcept
    {
        return true;
    }
};

namespace hearth::allocator {

// The memory behind strings.
class KFS_SERVICE_API MemoryRecycler {
public:
    static constexpr char const* Label = "hearth strings";

    // At least `size` bytes, aligned to 16; null when out of memory.
    //   granted  out or null: how many bytes the block really has
    static void* Allocate(std::size_t size, std::size_t* granted) noexcept;
    // Gives a block back. `size` is the size asked for or the size granted. Null is fine.
    static void Recycle(void* block, std::size_t size) noexcept;
};

template <class T>
class RecyclingAllocator {
public:
    using value_type = T;

    RecyclingAllocator() noexcept = default;
    template <class U>
    RecyclingAllocator(RecyclingAllocator<U> const&) noexcept
    {}

    T* allocate(std::size_t count)
    {
        static_assert(alignof(T) <= 16);
        if (count > std::numeric_limits<std::size_t>::max() / sizeof(T)) throw std::bad_array_new_length();
        if (void* const block = MemoryRecycler::Allocate(count * sizeof(T), nullptr)) return static_cast<T*>(block);
        throw std::bad_alloc();
    }
    void deallocate(T* block, std::size_t count) noexcept { MemoryRecycler::Recycle(block, count * sizeof(T)); }

    template <class U>
    bool operator==(RecyclingAllocator<U> const&) const noexcept
    {
        return true;
    }
};

}  // namespace hearth::allocator
