#pragma once

#include "frame/services/sequence.h"

#include <cstddef>
#include <cstdint>

inline constexpr int SEQp_AllocationId = 0x150000;

// What a handle points into: the head's address, and the head right behind it in the same block.
struct SEQp_List {
    SEQ_Head* head;
    SEQ_Head body;
};

inline bool SEQp_IsList(SEQ_Head const* const* list) noexcept
{
    return list != nullptr && *list != nullptr;
}

// Any int may be asked: a negative one is a great unsigned one.
inline bool SEQp_HasIndex(SEQ_Head const& head, int index) noexcept
{
    return static_cast<unsigned>(index) < static_cast<unsigned>(head.count);
}

inline std::size_t SEQp_Bytes(SEQ_Head const& head, int count) noexcept
{
    return static_cast<std::size_t>(count) * static_cast<std::size_t>(head.stride);
}

inline unsigned char* SEQp_Item(SEQ_Head const& head, int index) noexcept
{
    return head.items + SEQp_Bytes(head, index);
}

// Makes an unpinned list without item functions whose `count` items, not set here, lie in one block with the head: half
// the allocations, and an item is next to what leads to it. Such a list can grow like any other; it then leaves that
// room unused. `itemSize` and `count` are good ones. 0 or 4.
[[nodiscard]] int SEQp_NewInOneBlock(int itemSize, int count, SEQ_Head*** list) noexcept;

// Makes room for `count` items in all, with the room that keeps repeated appending cheap. 0 or a code; the items may
// move.
[[nodiscard]] int SEQp_Grow(SEQ_Head& head, int count) noexcept;

// Moves the items into a block of exactly `capacity` items, at least the count. 0 or 4, and then nothing has changed.
[[nodiscard]] int SEQp_SetCapacity(SEQ_Head& head, int capacity) noexcept;

// Gives back what the item owns, through the list's dispose function if it has one.
[[nodiscard]] inline int SEQp_DisposeItem(SEQ_Head** list, void* item)
{
    SEQ_Head& head = **list;
    return head.dispose ? head.dispose(head.refcon, list, item) : 0;
}
