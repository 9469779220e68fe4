#include "frame/services/memory.h"

#include "services/utility/growptr_private.h"
#include "services/utility/memorylabels_private.h"

#include <cstdlib>
#include <cstring>

namespace {

// Lies in front of every block.
struct alignas(16) BlockHead {
    Q_MemoryLabel* label;
    std::size_t size;
};
static_assert(sizeof(BlockHead) == 16);

// A handle is the address of `bytes`; what it points to follows.
struct alignas(16) HandleHead {
    char* bytes;
};
static_assert(sizeof(HandleHead) == 16);

thread_local int failCountdown = 0;  // 0: no failure is armed
thread_local bool failFired = false;

bool MustFail() noexcept
{
    if (failCountdown == 0 || --failCountdown > 0) return false;
    failFired = true;
    return true;
}

BlockHead* HeadOf(void* block) noexcept
{
    return static_cast<BlockHead*>(block) - 1;
}

template <class AllocateBytes>
void* Allocate(char const* label, std::size_t size, AllocateBytes allocateBytes) noexcept
{
    if (MustFail() || size > std::numeric_limits<std::size_t>::max() - sizeof(BlockHead)) return nullptr;
    void* const memory = allocateBytes(size + sizeof(BlockHead));
    if (!memory) return nullptr;
    Q_MemoryLabel* const entry = Q_FindMemoryLabel(label);
    entry->Add(size);
    return new (memory) BlockHead{entry, size} + 1;
}

constexpr std::size_t Granule = 16;

std::size_t RoundUp(std::size_t size) noexcept
{
    return size == 0 ? Granule : (size + Granule - 1) / Granule * Granule;
}

Q_MemoryLabel* StringLabel() noexcept
{
    static Q_MemoryLabel* const label = Q_FindMemoryLabel(hearth::allocator::MemoryRecycler::Label);
    return label;
}

}  // namespace

void* Q_AllocatePtr(int, char const* label, std::size_t size) noexcept
{
    return Allocate(
        label, size, [](std::size_t bytes) { return std::malloc(bytes); });
}

void* Q_AllocatePtrClear(int, char const* label, std::size_t size) noexcept
{
    return Allocate(
        label, size, [](std::size_t bytes) { return std::calloc(1, bytes); });
}

void Q_FreePtr(void* block) noexcept
{
    if (!block) return;
    BlockHead* const head = HeadOf(block);
    head->label->Remove(head->size);
    std::free(head);
}

void* Q_GrowPtr(void* block, std::size_t size) noexcept
{
    if (MustFail() || size > std::numeric_limits<std::size_t>::max() - sizeof(BlockHead)) return nullptr;
    void* const memory = std::realloc(HeadOf(block), size + sizeof(BlockHead));
    if (!memory) return nullptr;
    auto* const head = static_cast<BlockHead*>(memory);
    head->label->Remove(head->size);
    head->label->Add(size);
    head->size = size;
    return head + 1;
}

char** Q_AllocateHandleClear(int id, char const* label, std::size_t size) noexcept
{
    if (size > std::numeric_limits<std::size_t>::max() - sizeof(HandleHead)) return nullptr;
    void* const block = Q_AllocatePtrClear(id, label, size + sizeof(HandleHead));
    if (!block) return nullptr;
    return &(new (block) HandleHead{static_cast<char*>(block) + sizeof(HandleHead)})->bytes;
}

void Q_FreeHandle(void* handle) noexcept
{
    Q_FreePtr(handle);
}

std::size_t Q_GetHandleSize(char const* const* handle) noexcept
{
    if (!handle) return 0;
    return (reinterpret_cast<BlockHead const*>(handle) - 1)->size - sizeof(HandleHead);
}

void Q_AccountAllocationEx(std::size_t size, int add) noexcept
{
    Q_MemoryLabel* const label = Q_FindMemoryLabel(Q_AccountedElsewhere);
    if (add != 0)
        label->Add(size);
    else
        label->Remove(size);
}

void Q_FailAllocation(int n) noexcept
{
    failCountdown = n > 0 ? n : 0;
    failFired = false;
}

bool Q_FailAllocationFired() noexcept
{
    return failFired;
}

void* Q_MemTrackedObject::TrackedNew(std::size_t size, char const* label)
{
    if (void* const object = Q_AllocatePtr(0, label, size)) return object;
    throw std::bad_alloc();
}

void Q_MemTrackedObject::TrackedDelete(void* object) noexcept
{
    Q_FreePtr(object);
}

namespace hearth::allocator {

// The C library keeps small blocks for reuse in every thread. A second pool on top of it would gain nothing, and would
// hide the use of freed strings from the sanitizers.
void* MemoryRecycler::Allocate(std::size_t size, std::size_t* granted) noexcept
{
    if (MustFail() || size > std::numeric_limits<std::size_t>::max() - Granule) return nullptr;
    std::size_t const rounded = RoundUp(size);
    void* const block = std::malloc(rounded);
    if (!block) return nullptr;
    StringLabel()->Add(rounded);
    if (granted) *granted = rounded;
    return block;
}

void MemoryRecycler::Recycle(void* block, std::size_t size) noexcept
{
    if (!block) return;
    StringLabel()->Remove(RoundUp(size));
    std::free(block);
}

}  // namespace hearth::allocator
