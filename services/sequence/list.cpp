#include "services/sequence/list_private.h"

#include "frame/services/memory.h"

#include <algorithm>
#include <climits>
#include <cstring>
#include <memory>

namespace {

constexpr char const* ListLabel = "sorted item list";
constexpr char const* ItemsLabel = "sorted item list items";
constexpr int FirstCapacity = 4;

struct DisposeList {
    void operator()(SEQ_Head** list) const { static_cast<void>(SEQ_Dispose(list, 0)); }  // after a failure, which wins
};
using ListOwner = std::unique_ptr<SEQ_Head*, DisposeList>;

template <class Func>
void Replace(Func& present, Func wanted) noexcept
{
    if (wanted == static_cast<Func>(SEQ_RemoveFunc))
        present = nullptr;
    else if (wanted)
        present = wanted;
}

static_assert(sizeof(SEQp_List) % 16 == 0);  // items that follow the head are aligned like any others

unsigned char* BehindHead(SEQ_Head& head) noexcept
{
    return reinterpret_cast<unsigned char*>(&head + 1);
}

bool IsOneBlock(SEQ_Head& head) noexcept
{
    return head.items == BehindHead(head);
}

void FreeItems(SEQ_Head& head) noexcept
{
    if (!IsOneBlock(head)) Q_FreePtr(head.items);
}

SEQ_Head** MakeHead(void* block, int itemSize) noexcept
{
    SEQp_List* const made = new (block) SEQp_List{};
    made->head = &made->body;
    made->body.itemSize = itemSize;
    made->body.stride = (itemSize + 7) & ~7;
    return &made->head;
}

void CopyRefconAndFuncs(SEQ_Head const& from, SEQ_Head& copy) noexcept
{
    copy.refcon = from.refcon;
    copy.copy = from.copy;
    copy.dispose = from.dispose;
    copy.sort = from.sort;
}

// In the head's block items can't be given back as long as the list lives, also where it has outgrown them: only a few
// may lie there.
constexpr std::size_t MostBytesBehindHead = 1 << 14;

// The copy of a list whose items are plain bytes.
int DuplicateBytes(SEQ_Head const& from, SEQ_Head*** out)
{
    std::size_t const bytes = SEQp_Bytes(from, from.count);
    SEQ_Head** made = nullptr;
    if (bytes <= MostBytesBehindHead) {
        if (int const code = SEQp_NewInOneBlock(from.itemSize, from.count, &made)) return code;
    } else {
        if (int const code = SEQ_New(0, static_cast<short>(from.itemSize), 4, 1, &made)) return code;
        if (int const code = SEQp_SetCapacity(**made, from.count)) {
            static_cast<void>(SEQ_Dispose(made, 0));  // the first error wins
            return code;
        }
        (*made)->count = from.count;
    }
    CopyRefconAndFuncs(from, **made);
    std::memcpy((*made)->items, from.items, bytes);
    *out = made;
    return 0;
}

int CopyAllItems(SEQ_Head const* const* source, SEQ_Head& copy)
{
    SEQ_Head const& from = **source;
    if (from.count == 0) return 0;
    if (int const code = SEQp_SetCapacity(copy, from.count)) return code;
    std::memset(copy.items, 0, SEQp_Bytes(from, from.count));
    for (int i = 0; i < from.count; ++i) {
        if (int const code = from.copy(from.refcon, source, SEQp_Item(from, i), SEQp_Item(copy, i))) return code;
        copy.count = i + 1;  // what is made so far is what a failure has to dispose
    }
    return 0;
}

}  // namespace

int SEQp_SetCapacity(SEQ_Head& head, int capacity) noexcept
{
    unsigned char* items = nullptr;
    if (capacity > 0) {
        std::size_t const bytes = SEQp_Bytes(head, capacity);
        items = static_cast<unsigned char*>(Q_AllocatePtr(SEQp_AllocationId, ItemsLabel, bytes));
        if (!items) return Q_Err_OutOfMemory;
        if (head.count > 0) std::memcpy(items, head.items, SEQp_Bytes(head, head.count));
    }
    FreeItems(head);
    head.items = items;
    head.capacity = capacity;
    return 0;
}

int SEQp_NewInOneBlock(int itemSize, int count, SEQ_Head*** list) noexcept
{
    std::size_t const stride = (static_cast<std::size_t>(itemSize) + 7) & ~std::size_t{7};
    std::size_t const bytes = sizeof(SEQp_List) + stride * static_cast<std::size_t>(count);
    void* const block = Q_AllocatePtr(SEQp_AllocationId, ListLabel, bytes);
    if (!block) return Q_Err_OutOfMemory;
    SEQ_Head** const made = MakeHead(block, itemSize);
    (*made)->items = BehindHead(**made);
    (*made)->count = count;
    (*made)->capacity = count;
    *list = made;
    return 0;
}

int SEQp_Grow(SEQ_Head& head, int count) noexcept
{
    if (count <= head.capacity) return 0;
    long long const roomy = static_cast<long long>(head.capacity) + head.capacity / 2;
    long long const capacity = std::max({static_cast<long long>(count), roomy, static_cast<long long>(FirstCapacity)});
    return SEQp_SetCapacity(head, static_cast<int>(std::min<long long>(capacity, INT_MAX)));
}

int SEQ_New(int, short itemSize, int, int, SEQ_Head*** list)
{
    if (itemSize <= 0 || !list) return SEQ_Err_BadArgument;
    void* const block = Q_AllocatePtr(SEQp_AllocationId, ListLabel, sizeof(SEQp_List));
    if (!block) return Q_Err_OutOfMemory;
    *list = MakeHead(block, itemSize);
    return 0;
}

int SEQ_Dispose(SEQ_Head** list, long)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    SEQ_Head& head = **list;
    int first = 0;
    if (head.dispose)
        for (int i = 0; i < head.count; ++i)
            if (int const code = SEQp_DisposeItem(list, SEQp_Item(head, i)); first == 0) first = code;
    FreeItems(head);
    Q_FreePtr(list);  // the handle is the address of the block's first word
    return first;
}

int SEQ_Duplicate(SEQ_Head const* const* list, long, SEQ_Head*** out)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!out) return SEQ_Err_BadArgument;
    SEQ_Head const& source = **list;
    if (!source.copy && source.count > 0) return DuplicateBytes(source, out);
    SEQ_Head** made = nullptr;
    if (int const code = SEQ_New(0, static_cast<short>(source.itemSize), 4, 1, &made)) return code;
    ListOwner owner(made);
    CopyRefconAndFuncs(source, **made);
    if (int const code = CopyAllItems(list, **made)) return code;
    *out = owner.release();
    return 0;
}

int SEQ_SetFuncs(SEQ_Head** list, int count, SEQ_Funcs const* funcs)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (count != 3 || !funcs) return SEQ_Err_BadArgument;
    Replace((*list)->copy, funcs->copy);
    Replace((*list)->dispose, funcs->dispose);
    Replace((*list)->sort, funcs->sort);
    return 0;
}

int SEQ_SetRefcon(void* refcon, SEQ_Head** list)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    (*list)->refcon = refcon;
    return 0;
}

int SEQ_LockConst(int, SEQ_Head const* const* list)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    ++(*list)->pins;
    return 0;
}

int SEQ_UnlockConst(SEQ_Head const* const* list)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if ((*list)->pins == 0) return SEQ_Err_NotPinned;
    --(*list)->pins;
    return 0;
}

int SEQ_Lock(int reserved, SEQ_Head** list)
{
    return SEQ_LockConst(reserved, list);
}

int SEQ_Unlock(SEQ_Head** list)
{
    return SEQ_UnlockConst(list);
}

int SEQ_GetItemSize(SEQ_Head const* const* list)
{
    return SEQp_IsList(list) ? (*list)->itemSize : 0;
}

int SEQ_GetPinCount(SEQ_Head const* const* list)
{
    return SEQp_IsList(list) ? (*list)->pins : 0;
}

int SEQ_ReserveSpace(int count, SEQ_Head** list)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (count < 0) return SEQ_Err_BadArgument;
    // Exactly: who reserves knows the final count.
    return count > (*list)->capacity ? SEQp_SetCapacity(**list, count) : 0;
}

int SEQ_Compact(SEQ_Head** list)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    SEQ_Head& head = **list;
    // Room in the head's own block can't be given back.
    if (head.pins > 0 || head.capacity == head.count || IsOneBlock(head)) return 0;
    return SEQp_SetCapacity(head, head.count);
}

int SEQ_SetNumItems(int count, SEQ_Head** list, long)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (count < 0) return SEQ_Err_BadArgument;
    SEQ_Head& head = **list;
    while (head.count > count) {
        if (int const code = SEQp_DisposeItem(list, SEQp_Item(head, head.count - 1))) return code;
        --head.count;
    }
    if (head.count == count) return 0;
    if (int const code = SEQp_Grow(head, count)) return code;
    std::memset(SEQp_Item(head, head.count), 0, SEQp_Bytes(head, count - head.count));
    head.count = count;
    return 0;
}
