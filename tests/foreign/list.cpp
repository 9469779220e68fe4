// Item lists of another make, as unlike our own as the interface allows: every item lies on its own, and wanders at each
// look at an unpinned list.
#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <dlfcn.h>

#include <cstring>
#include <set>
#include <utility>
#include <vector>

namespace {

using Item = std::vector<double>;

// What handles point to. The first three words behind the head's address are what callers may touch of it.
struct List {
    SEQ_Head* head = reinterpret_cast<SEQ_Head*>(&reserved);
    void* reserved = nullptr;
    void* refcon = nullptr;
    int count = 0;
    int pins = 0;
    std::vector<Item> items;
    SEQ_Funcs funcs{};
    int itemSize = 0;

    bool Has(int index) const { return index >= 0 && index < count; }
    SEQ_Head** Handle() { return &head; }
};

std::set<void const*> lists;

List& Of(SEQ_Head const* const* handle)
{
    return *reinterpret_cast<List*>(const_cast<SEQ_Head**>(handle));
}

Item NewItem(List const& list, void const* bytes = nullptr)
{
    Item item((static_cast<std::size_t>(list.itemSize) + 7) / 8);
    if (bytes) std::memcpy(item.data(), bytes, static_cast<std::size_t>(list.itemSize));
    return item;
}

void Wander(List& list)
{
    if (list.pins > 0) return;
    for (Item& item : list.items) {
        Item elsewhere(item);
        std::memset(item.data(), 0xEE, item.size() * 8);
        item.swap(elsewhere);
    }
}

int DisposeItem(List& list, Item& item)
{
    return list.funcs.dispose ? list.funcs.dispose(list.refcon, list.Handle(), item.data()) : 0;
}

int CopyItem(List& list, void const* source, void* destination)
{
    if (list.funcs.copy) return list.funcs.copy(list.refcon, list.Handle(), source, destination);
    std::memcpy(destination, source, static_cast<std::size_t>(list.itemSize));
    return 0;
}

int Place(List& list, Item item, int index)
{
    if (index == -1) index = list.count;
    if (index < 0 || index > list.count) return SEQ_Err_BadIndex;
    Wander(list);
    list.items.insert(list.items.begin() + index, std::move(item));
    ++list.count;
    return 0;
}

template <class Func>
void Replace(Func& present, Func wanted)
{
    if (wanted) present = wanted == static_cast<Func>(SEQ_RemoveFunc) ? nullptr : wanted;
}

}  // namespace

int SEQ_New(int, short itemSize, int, int, SEQ_Head*** list)
{
    auto* const made = new List;
    made->itemSize = itemSize;
    lists.insert(made);
    *list = made->Handle();
    return 0;
}

int SEQ_Dispose(SEQ_Head** handle, long reserved)
{
    if (!handle) return SEQ_Err_BadList;
    if (!lists.contains(handle)) {  // an arc table, which the kernel has from the services that it knows
        auto const next = reinterpret_cast<int (*)(SEQ_Head**, long)>(dlsym(RTLD_NEXT, "_Z11SEQ_DisposePP8SEQ_Headl"));
        return next(handle, reserved);
    }
    List& list = Of(handle);
    for (Item& item : list.items) DisposeItem(list, item);
    lists.erase(handle);
    delete &list;
    return 0;
}

int SEQ_Duplicate(SEQ_Head const* const* handle, long, SEQ_Head*** out)
{
    List& source = Of(handle);
    if (int const code = SEQ_New(0, static_cast<short>(source.itemSize), 4, 1, out)) return code;
    List& made = Of(*out);
    made.refcon = source.refcon;
    made.funcs = source.funcs;
    for (Item const& item : source.items)
        if (int const code = SEQ_InsertCopy(item.data(), -1, *out, 0)) return code;
    return 0;
}

int SEQ_SetFuncs(SEQ_Head** handle, int, SEQ_Funcs const* funcs)
{
    Replace(Of(handle).funcs.copy, funcs->copy);
    Replace(Of(handle).funcs.dispose, funcs->dispose);
    Replace(Of(handle).funcs.sort, funcs->sort);
    return 0;
}

int SEQ_SetRefcon(void* refcon, SEQ_Head** handle)
{
    Of(handle).refcon = refcon;
    return 0;
}

int SEQ_LockConst(int, SEQ_Head const* const* handle)
{
    if (!handle) return SEQ_Err_BadList;
    ++Of(handle).pins;
    return 0;
}

int SEQ_UnlockConst(SEQ_Head const* const* handle)
{
    return Of(handle).pins-- > 0 ? 0 : SEQ_Err_NotPinned;
}

int SEQ_Lock(int reserved, SEQ_Head** handle)
{
    return SEQ_LockConst(reserved, handle);
}

int SEQ_Unlock(SEQ_Head** handle)
{
    return SEQ_UnlockConst(handle);
}

int SEQ_GetItemSize(SEQ_Head const* const* handle)
{
    return Of(handle).itemSize;
}

int SEQ_GetConstAddress(SEQ_Head const* const* handle, int index, void const** item)
{
    if (!handle) return SEQ_Err_BadList;
    List& list = Of(handle);
    if (index == -1) index = list.count - 1;
    if (!list.Has(index)) return SEQ_Err_BadIndex;
    Wander(list);
    *item = list.items[static_cast<std::size_t>(index)].data();
    return 0;
}

int SEQ_GetAddress(SEQ_Head** handle, int index, int lock, void** item)
{
    void const* found = nullptr;
    if (index < 0) return SEQ_Err_BadIndex;
    if (int const code = SEQ_GetConstAddress(handle, index, &found)) return code;
    *item = const_cast<void*>(found);
    Of(handle).pins += lock;
    return 0;
}

int SEQ_GetItemCopy(SEQ_Head const* const* handle, long, int index, void* destination)
{
    void const* item = nullptr;
    if (int const code = SEQ_GetConstAddress(handle, index, &item)) return code;
    return CopyItem(Of(handle), item, destination);
}

int SEQ_SetItemCopy(void const* source, int index, SEQ_Head** handle, long, long)
{
    List& list = Of(handle);
    if (!list.Has(index)) return SEQ_Err_BadIndex;
    Item made = NewItem(list);
    if (int const code = CopyItem(list, source, made.data())) return code;
    Item& place = list.items[static_cast<std::size_t>(index)];
    DisposeItem(list, place);
    place = std::move(made);
    return 0;
}

int SEQ_InsertCopy(void const* source, int index, SEQ_Head** handle, long)
{
    Item made = NewItem(Of(handle));
    if (int const code = CopyItem(Of(handle), source, made.data())) return code;
    return Place(Of(handle), std::move(made), index);
}

int SEQ_Insert(void const* source, int index, SEQ_Head** handle)
{
    return Place(Of(handle), NewItem(Of(handle), source), index);
}

int SEQ_Remove(int index, SEQ_Head** handle, long, void* out)
{
    List& list = Of(handle);
    if (!list.Has(index)) return SEQ_Err_BadIndex;
    Item& item = list.items[static_cast<std::size_t>(index)];
    if (out)
        std::memcpy(out, item.data(), static_cast<std::size_t>(list.itemSize));
    else
        DisposeItem(list, item);
    list.items.erase(list.items.begin() + index);
    --list.count;
    return 0;
}

int SEQ_GetSortedConstItem(SEQ_Head const* const* handle, long, long, void const* probe, unsigned char* found, long,
                           int* index)
{
    List& list = Of(handle);
    *index = 0;
    *found = 0;
    for (Item const& item : list.items) {
        int const order = list.funcs.sort(list.refcon, handle, probe, item.data());
        *found = order == 0;
        if (order <= 0) break;
        ++*index;
    }
    return 0;
}

int SEQ_GetSortedItem(SEQ_Head** handle, long, long, void const* probe, unsigned char* found, long, int* index)
{
    return SEQ_GetSortedConstItem(handle, 0, 0, probe, found, 0, index);
}

int SEQ_ForRange(SEQ_Head** handle, int first, int last, long refcon, SEQ_IterFunc func, int* lastVisited)
{
    for (int i = first;; i += first <= last ? 1 : -1) {
        if (!Of(handle).Has(i)) return SEQ_Err_BadIndex;
        if (lastVisited) *lastVisited = i;
        int const code = func(handle, refcon, i, Of(handle).items[static_cast<std::size_t>(i)].data());
        if (code != 0 || i == last) return code;
    }
}

int SEQ_ForEach(SEQ_Head** handle, long refcon, SEQ_IterFunc func, long)
{
    return Of(handle).count == 0 ? 0 : SEQ_ForRange(handle, 0, Of(handle).count - 1, refcon, func, nullptr);
}

int SEQ_ForEachConst(SEQ_Head const* const* handle, long refcon, SEQ_ConstIterFunc func, long)
{
    for (int i = 0; i < Of(handle).count; ++i)
        if (int const code = func(handle, refcon, i, Of(handle).items[static_cast<std::size_t>(i)].data())) return code;
    return 0;
}

int SEQ_ReserveSpace(int, SEQ_Head**)
{
    return 0;
}

int SEQ_Compact(SEQ_Head**)
{
    return 0;
}

int SEQ_SetNumItems(int count, SEQ_Head** handle, long)
{
    while (Of(handle).count > count) static_cast<void>(SEQ_Remove(Of(handle).count - 1, handle, 0, nullptr));
    while (Of(handle).count < count) Place(Of(handle), NewItem(Of(handle)), -1);
    return 0;
}

int SEQ_GetPinCount(SEQ_Head const* const* handle)
{
    return handle ? Of(handle).pins : 0;
}
