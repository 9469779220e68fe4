#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"

#include <algorithm>

// Marks of keys whose derived data has to be computed anew. An edit at key i reaches its neighbours:
//
//   SetInvalid(i + 1, 2)        SetArcInvalid(i + 2, 4)
//
//        i-1   i   i+1          i-2  i-1   i   i+1  i+2
//     ----o====o====o----     ---o====o====o====o====o---

namespace {

struct Range {
    int first = KFS_INVALID_INDEX;
    int last = KFS_INVALID_INDEX;

    bool IsNone() const { return first == KFS_INVALID_INDEX; }
};

// The keys from `index` - `count` to `index`, cut to the list; `index` -1 counts from the last key. A mark that lies
// behind the list is none.
Range MarkedRange(int keyCount, int index, int count)
{
    int reach = count;
    int last = index;
    if (index == -1) {
        last = keyCount - 1;
    } else if (index >= keyCount) {
        last = keyCount - 1;
        long const shrunk = static_cast<long>(count) - (static_cast<long>(index) - last);
        reach = static_cast<int>(std::max(shrunk, 0L));
    }
    if (reach < 1) return {};
    long const first = static_cast<long>(last) - reach;
    return {static_cast<int>(std::max(first, 0L)), std::max(last, 0)};
}

void Merge(Range mark, int* stored)
{
    if (mark.IsNone()) return;
    stored[0] = stored[0] == KFS_INVALID_INDEX ? mark.first : std::min(stored[0], mark.first);
    stored[1] = stored[1] == KFS_INVALID_INDEX ? mark.last : std::max(stored[1], mark.last);
}

void Clear(int* stored)
{
    stored[0] = KFS_INVALID_INDEX;
    stored[1] = KFS_INVALID_INDEX;
}

// A key of a list that the caller has pinned.
bool IsFloatKey(SEQ_Head** keys, int index, KFSp_FirstError& error)
{
    void* item = nullptr;
    int const code = SEQ_GetAddress(keys, index, 0, &item);
    error.Keep(code);
    return code == 0 && (static_cast<KFS_KeyScalar*>(item)->flags & KFS_KeyFlag_Float) != 0;
}

// The time of a float key follows from the anchors around it, so a range never ends on one, except at the ends of the
// list.
int WidenOverFloatKeys(SEQ_Head** keys, Range* range)
{
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(keys, error);
        int const lastKey = (*keys)->count - 1;
        while (error.None() && range->first > 0 && IsFloatKey(keys, range->first, error)) --range->first;
        while (error.None() && range->last < lastKey && IsFloatKey(keys, range->last, error)) ++range->last;
    }
    return error.Code();
}

}  // namespace

int KFS_Stream::SetInvalid(int index, short count) const
{
    auto* const data = const_cast<KFS_StreamKeyData*>(GetKeyData());
    int const keyCount = HasNoKeys() ? 0 : KFSp_ItemCount(data);
    if (keyCount == 0) {
        Clear(data->invalidKeyIndex);
        return 0;
    }
    Range mark = MarkedRange(keyCount, index, count);
    int code = 0;
    if (IsSpatial() && !mark.IsNone()) code = WidenOverFloatKeys(data->keys, &mark);
    Merge(mark, data->invalidKeyIndex);
    return code;
}

int KFS_Stream::SetArcInvalid(int index, short count) const
{
    auto* const data = const_cast<KFS_StreamKeyData*>(GetKeyData());
    int const keyCount = HasNoKeys() ? 0 : KFSp_ItemCount(data);
    if (keyCount == 0) {
        Clear(data->arcInvalidKeyIndex);
        return 0;
    }
    Merge(MarkedRange(keyCount, index, count), data->arcInvalidKeyIndex);
    return 0;
}
