#include "services/sequence/list_private.h"

#include "frame/services/memory.h"

#include <climits>
#include <cstring>
#include <functional>

namespace {

// Room for one item outside the list: a copy is finished there before the list changes.
class ScratchItem {
public:
    explicit ScratchItem(int size) noexcept
    {
        std::size_t const bytes = static_cast<std::size_t>(size);
        if (bytes > sizeof small_) item_ = big_ = Q_AllocatePtr(SEQp_AllocationId, "sorted item list scratch", bytes);
        if (item_) std::memset(item_, 0, bytes);
    }
    ScratchItem(ScratchItem const&) = delete;
    ScratchItem& operator=(ScratchItem const&) = delete;
    ~ScratchItem() { Q_FreePtr(big_); }

    void* get() const noexcept { return item_; }  // null when out of memory

private:
    alignas(16) unsigned char small_[512];
    void* big_ = nullptr;
    void* item_ = small_;
};

int CopyItem(SEQ_Head const* const* list, void const* source, void* destination)
{
    SEQ_Head const& head = **list;
    if (head.copy) return head.copy(head.refcon, list, source, destination);
    std::memmove(destination, source, static_cast<std::size_t>(head.itemSize));
    return 0;
}

bool LiesInList(SEQ_Head const& head, void const* address) noexcept
{
    std::less<void const*> const before;
    return head.count > 0 && !before(address, head.items) && before(address, SEQp_Item(head, head.count));
}

// Opens a gap at the index and puts the bytes there. The room is there already, and the bytes lie outside the list.
void PutBytes(SEQ_Head& head, int index, void const* bytes) noexcept
{
    unsigned char* const place = SEQp_Item(head, index);
    std::memmove(place + head.stride, place, SEQp_Bytes(head, head.count - index));
    std::memcpy(place, bytes, static_cast<std::size_t>(head.itemSize));
    ++head.count;
}

int InsertItem(void const* source, int index, SEQ_Head** list, bool throughCopyFunc)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    SEQ_Head& head = **list;
    if (!source) return SEQ_Err_BadArgument;
    if (index == -1) index = head.count;
    if (index < 0 || index > head.count) return SEQ_Err_BadIndex;
    if (head.count == INT_MAX) return SEQ_Err_TooMany;

    bool const inside = LiesInList(head, source);
    std::ptrdiff_t const offset = inside ? static_cast<unsigned char const*>(source) - head.items : 0;
    if (int const code = SEQp_Grow(head, head.count + 1)) return code;
    if (inside) source = head.items + offset;  // growing may have moved it

    bool const copies = throughCopyFunc && head.copy;
    if (!copies && !inside) {
        PutBytes(head, index, source);
        return 0;
    }
    ScratchItem const scratch(head.itemSize);
    if (!scratch.get()) return Q_Err_OutOfMemory;
    if (!copies)
        std::memcpy(scratch.get(), source, static_cast<std::size_t>(head.itemSize));
    else if (int const code = CopyItem(list, source, scratch.get()))
        return code;
    PutBytes(head, index, scratch.get());
    return 0;
}

}  // namespace

int SEQ_GetConstAddress(SEQ_Head const* const* list, int index, void const** item)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!item) return SEQ_Err_BadArgument;
    SEQ_Head const& head = **list;
    if (!SEQp_HasIndex(head, index)) {
        if (index != -1 || head.count == 0) return SEQ_Err_BadIndex;
        index = head.count - 1;
    }
    *item = SEQp_Item(head, index);
    return 0;
}

int SEQ_GetAddress(SEQ_Head** list, int index, int lock, void** item)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!item) return SEQ_Err_BadArgument;
    SEQ_Head const& head = **list;
    if (!SEQp_HasIndex(head, index)) return SEQ_Err_BadIndex;
    *item = SEQp_Item(head, index);
    if (lock != 0) ++head.pins;
    return 0;
}

int SEQ_GetItemCopy(SEQ_Head const* const* list, long, int index, void* destination)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!destination) return SEQ_Err_BadArgument;
    if (!SEQp_HasIndex(**list, index)) return SEQ_Err_BadIndex;
    return CopyItem(list, SEQp_Item(**list, index), destination);
}

int SEQ_SetItemCopy(void const* source, int index, SEQ_Head** list, long, long)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    if (!source) return SEQ_Err_BadArgument;
    SEQ_Head& head = **list;
    if (!SEQp_HasIndex(head, index)) return SEQ_Err_BadIndex;

    ScratchItem const scratch(head.itemSize);
    if (!scratch.get()) return Q_Err_OutOfMemory;
    if (int const code = CopyItem(list, source, scratch.get())) return code;
    if (int const code = SEQp_DisposeItem(list, SEQp_Item(head, index))) {
        static_cast<void>(SEQp_DisposeItem(list, scratch.get()));  // the first error wins
        return code;
    }
    std::memcpy(SEQp_Item(head, index), scratch.get(), static_cast<std::size_t>(head.itemSize));
    return 0;
}

int SEQ_InsertCopy(void const* source, int index, SEQ_Head** list, long)
{
    return InsertItem(source, index, list, true);
}

int SEQ_Insert(void const* source, int index, SEQ_Head** list)
{
    return InsertItem(source, index, list, false);
}

int SEQ_Remove(int index, SEQ_Head** list, long, void* out)
{
    if (!SEQp_IsList(list)) return SEQ_Err_BadList;
    SEQ_Head& head = **list;
    if (!SEQp_HasIndex(head, index)) return SEQ_Err_BadIndex;
    unsigned char* const place = SEQp_Item(head, index);
    if (out)
        std::memcpy(out, place, static_cast<std::size_t>(head.itemSize));
    else if (int const code = SEQp_DisposeItem(list, place))
        return code;
    std::memmove(place, place + head.stride, SEQp_Bytes(head, head.count - index - 1));
    --head.count;
    return 0;
}
