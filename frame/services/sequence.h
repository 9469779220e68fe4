// Lists of fixed-size items behind a handle: keys, key records of a file, arc-length tables, samples.
//
// A list is a growable array. Its items lie in the order of their indices in one block aligned to 16, each at a
// multiple of 8 bytes: an item size that is a multiple of 8 leaves no gaps, so that the address of item 0 and the item
// size reach all items; with any other size each address has to be asked for.
//
// Handles  `SEQ_Head**` for writing, `SEQ_Head const* const*` for reading. A null handle is refused by every operation.
// Indices  0 to count - 1. Any int may be passed: a bad one is answered with SEQ_Err_BadIndex and changes nothing.
// Results  0, or a code. An item function's own code comes through unchanged. Out of memory is 4, and the list is then
//          what it was before the call.
// Pins     SEQ_Lock and SEQ_Unlock count; they keep nobody out. While a list is pinned, only an insertion or a growing
//          count may move its items (the pin is then good for indices, no longer for addresses); SEQ_Compact waits.
// Threads  No lock. Any number of threads may read one list at a time (SEQ_LockConst and SEQ_UnlockConst write the pin
//          counter, so pinning counts as writing); a writer must be alone.
#pragma once

#include "frame/services/export.h"

struct CKF_File;

// What callers may touch of a list. Everything behind `count` belongs to the service.
struct SEQ_Head {
    void* reserved;  // not used by the service
    void* refcon;    // the reference word; handed to all item functions as their first argument
    int count;       // read only: the number of items

    int itemSize;
    int stride;  // from one item to the next: itemSize made a multiple of 8, so that numbers in items stay aligned
    int capacity;
    mutable int pins;
    unsigned char* items;
    int (*copy)(void*, SEQ_Head const* const*, void const*, void*);
    int (*dispose)(void*, SEQ_Head**, void*);
    int (*sort)(void*, SEQ_Head const* const*, void const*, void const*);
};

// Codes of this service; 4, out of memory, is common to all services.
inline constexpr int SEQ_Err_BadList = 0x1501;      // null handle, or the handle of a list without a head
inline constexpr int SEQ_Err_BadIndex = 0x1502;     // the index isn't in the list
inline constexpr int SEQ_Err_BadArgument = 0x1503;  // null where an address is needed, a bad count or a bad item size
inline constexpr int SEQ_Err_NoSortFunc = 0x1504;   // a sorted search in a list that has no sort function
inline constexpr int SEQ_Err_NotPinned = 0x1505;    // an unlock without a lock; the counter stays at 0
inline constexpr int SEQ_Err_TooMany = 0x1506;      // the count would not fit an int

// Item functions. The first argument is the list's refcon. They must not insert into or remove from the list that they
// are called for.
//
// Copy makes `destination` a copy of `source` that stands on its own. `destination` holds itemSize zeroed bytes,
// except in SEQ_GetItemCopy, where it is the caller's as it comes. A non-zero result means that nothing was made.
// `list` is the source list in SEQ_Duplicate and the list itself everywhere else.
using SEQ_CopyFunc = int (*)(void* refcon, SEQ_Head const* const* list, void const* source, void* destination);
// Dispose gives back what the item owns, not the item's bytes. A non-zero result means that the item is still whole.
using SEQ_DisposeFunc = int (*)(void* refcon, SEQ_Head** list, void* item);
// Sort answers negative, 0 or positive as `a` comes before, with or after `b`.
using SEQ_SortFunc = int (*)(void* refcon, SEQ_Head const* const* list, void const* a, void const* b);

// Iteration functions. A non-zero result ends the iteration and is its result.
using SEQ_IterFunc = int (*)(SEQ_Head** list, long refcon, int index, void* item);
using SEQ_ConstIterFunc = int (*)(SEQ_Head const* const* list, long refcon, int index, void const* item);

// For SEQ_SetFuncs. In each entry null leaves the list's function as it is and SEQ_RemoveFunc takes it away.
struct SEQ_Funcs {
    SEQ_CopyFunc copy;
    SEQ_DisposeFunc dispose;
    SEQ_SortFunc sort;
};

// Converts to the function pointer -1 of each of the three types: `SEQ_Funcs{SEQ_RemoveFunc, SEQ_RemoveFunc, nullptr}`.
struct SEQ_RemoveFuncValue {
    operator SEQ_CopyFunc() const noexcept { return reinterpret_cast<SEQ_CopyFunc>(-1L); }
    operator SEQ_DisposeFunc() const noexcept { return reinterpret_cast<SEQ_DisposeFunc>(-1L); }
    operator SEQ_SortFunc() const noexcept { return reinterpret_cast<SEQ_SortFunc>(-1L); }
};
inline constexpr SEQ_RemoveFuncValue SEQ_RemoveFunc{};

// ---- the life of a list

// Makes an empty list without item functions: items are copied byte by byte, owned by nobody, and can't be searched.
//   itemSize  1 to 32767 bytes; SEQ_Err_BadArgument otherwise
//   list      out; untouched on failure. To be freed with SEQ_Dispose.
// The other three arguments have no meaning here; callers pass 0, 4 and 1.
[[nodiscard]] KFS_SERVICE_API int SEQ_New(int reserved, short itemSize, int reserved4, int reserved1, SEQ_Head*** list);

// Disposes every item, first to last, and frees the list. The handle is dead whatever the result is, pinned or not.
// The result is the first code of a dispose function; the later items are disposed all the same.
[[nodiscard]] KFS_SERVICE_API int SEQ_Dispose(SEQ_Head** list, long reserved);

// Makes a list with a copy of each item, with the source's item functions and refcon, unpinned. If a copy fails, what
// was made is disposed, and `out` is untouched.
[[nodiscard]] KFS_SERVICE_API int SEQ_Duplicate(SEQ_Head const* const* list, long reserved, SEQ_Head*** out);

// Sets item functions. `count` is 3, the number of entries of SEQ_Funcs.
[[nodiscard]] KFS_SERVICE_API int SEQ_SetFuncs(SEQ_Head** list, int count, SEQ_Funcs const* funcs);

// Writes the list's refcon.
[[nodiscard]] KFS_SERVICE_API int SEQ_SetRefcon(void* refcon, SEQ_Head** list);

// ---- pins

// Add a pin and take one away. They nest. The int has no meaning; callers pass 1.
[[nodiscard]] KFS_SERVICE_API int SEQ_Lock(int reserved, SEQ_Head** list);
[[nodiscard]] KFS_SERVICE_API int SEQ_LockConst(int reserved, SEQ_Head const* const* list);
[[nodiscard]] KFS_SERVICE_API int SEQ_Unlock(SEQ_Head** list);
[[nodiscard]] KFS_SERVICE_API int SEQ_UnlockConst(SEQ_Head const* const* list);

// The item size that a list was made with; 0 for a null handle.
KFS_SERVICE_API int SEQ_GetItemSize(SEQ_Head const* const* list);

// The number of pins that are still owed an unlock; 0 for a null handle.
KFS_SERVICE_API int SEQ_GetPinCount(SEQ_Head const* const* list);

// ---- items

// The address of an item. With `lock` 1 the list is pinned on success and the caller owes an SEQ_Unlock; with 0 the
// caller holds a pin already. On failure nothing is pinned and `item` is untouched.
[[nodiscard]] KFS_SERVICE_API int SEQ_GetAddress(SEQ_Head** list, int index, int lock, void** item);

// The address of an item for reading; -1 names the last one. Takes no pin. On failure `item` is untouched.
// Cost: a bounds check, a multiplication and an addition.
[[nodiscard]] KFS_SERVICE_API int SEQ_GetConstAddress(SEQ_Head const* const* list, int index, void const** item);

// Copies an item to `destination` (itemSize bytes, not zeroed here) through the copy function.
[[nodiscard]] KFS_SERVICE_API int SEQ_GetItemCopy(SEQ_Head const* const* list, long reserved, int index,
                                                  void* destination);

// Puts a copy of `source` in the place of an item, which is disposed. If the copy can't be made, or the old item can't
// be disposed, the old item stays as it was. The items don't move. `source` may be an item of this list.
[[nodiscard]] KFS_SERVICE_API int SEQ_SetItemCopy(void const* source, int index, SEQ_Head** list, long reserved,
                                                  long reserved2);

// Inserts a copy of `source`, made by the copy function, so that it stands at `index`; the count, or -1, appends.
// `source` may be an item of this list. Amortised cost: the bytes behind `index`.
[[nodiscard]] KFS_SERVICE_API int SEQ_InsertCopy(void const* source, int index, SEQ_Head** list, long reserved);

// The same without the copy function: the list takes over the bytes of `source` and what they own.
[[nodiscard]] KFS_SERVICE_API int SEQ_Insert(void const* source, int index, SEQ_Head** list);

// Removes an item. With `out` (itemSize bytes) the item is moved there and not disposed; with null it is disposed, and
// it stays where it is if that fails. The capacity stays.
[[nodiscard]] KFS_SERVICE_API int SEQ_Remove(int index, SEQ_Head** list, long reserved, void* out);

// Binary search with the sort function, the probe being its first operand. The list must be in ascending order.
//   found  out: 1 if an item compares equal, else 0
//   index  out: the first item that compares equal; if there is none, the index of the first item after the probe,
//          which is the count if the probe comes after all items
// On failure both are untouched.
[[nodiscard]] KFS_SERVICE_API int SEQ_GetSortedItem(SEQ_Head** list, long reserved, long reserved2, void const* probe,
                                                    unsigned char* found, long reserved3, int* index);
[[nodiscard]] KFS_SERVICE_API int SEQ_GetSortedConstItem(SEQ_Head const* const* list, long reserved, long reserved2,
                                                         void const* probe, unsigned char* found, long reserved3,
                                                         int* index);

// ---- all items

// Calls the function for each item in the order of the indices. The function may change items, and may insert or
// remove: the walk goes by index and ends at the count of that moment.
[[nodiscard]] KFS_SERVICE_API int SEQ_ForEach(SEQ_Head** list, long refcon, SEQ_IterFunc func, long reserved);
[[nodiscard]] KFS_SERVICE_API int SEQ_ForEachConst(SEQ_Head const* const* list, long refcon, SEQ_ConstIterFunc func,
                                                   long reserved);

// The same for the indices `first` to `last`, both included, stepping down if `first` is above `last`. Both must be in
// the list, or nothing is called. `lastVisited`, which may be null, receives the index of the last call.
[[nodiscard]] KFS_SERVICE_API int SEQ_ForRange(SEQ_Head** list, int first, int last, long refcon, SEQ_IterFunc func,
                                               int* lastVisited);

// ---- size

// Makes room for `count` items in all; a count that has room already is fine. Later insertions up to that count need no
// memory and move no block.
[[nodiscard]] KFS_SERVICE_API int SEQ_ReserveSpace(int count, SEQ_Head** list);

// Gives spare capacity back. A pinned list is left as it is, and so is a small duplicate that hasn't grown, whose items
// lie in one block with it: neither is an error.
[[nodiscard]] KFS_SERVICE_API int SEQ_Compact(SEQ_Head** list);

// Sets the count. New items are zero; items beyond the count are disposed, last first, down to one that refuses.
[[nodiscard]] KFS_SERVICE_API int SEQ_SetNumItems(int count, SEQ_Head** list, long reserved);

// ---- files

// Writes the list into a chunk file at its present place, as one atom "seql": item size, count, and the items' bytes as
// they are, one behind the other. Swapping is the caller's. Result: 0 or the chunk file's code.
[[nodiscard]] KFS_SERVICE_API int SEQ_Write(SEQ_Head const* const* list, CKF_File* file);

// Reads the next "seql" of the innermost open list into a new list without item functions. The chunk must hold exactly
// the items that it claims, which is checked before anything is allocated; SEQ_Err_BadChunk, and the file has then
// failed with that code. On failure `list` is untouched.
inline constexpr int SEQ_Err_BadChunk = 0x1507;
[[nodiscard]] KFS_SERVICE_API int SEQ_Read(CKF_File* file, SEQ_Head*** list);
