// Marks of keys whose derived data has to be computed anew.

#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"

#include <algorithm>

// An edit at key i reaches its neighbours:
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
// behind the list falls on the last key: when the key behind it goes, its own handles are no longer right.
Range MarkedRange(int keyCount, int index, int count)
{
    if (count < 1) return {};
    int const lastKey = keyCount - 1;
    int const last = index == -1 ? lastKey : std::min(index, lastKey);
    long const first = (index == -1 ? long{lastKey} : long{index}) - count;
    return {static_cast<int>(std::clamp(first, 0L, long{lastKey})), std::max(last, 0)};
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
bool IsFloatKey(KFS_StreamKeyData const* data, int index, KFSp_FirstError& error)
{
    KFS_KeyScalar* key = nullptr;
    int const code = KFSp_GetKey(data, index, &key);
    error.Keep(code);
    return code == 0 && KFSp_Floats(key);
}

// The time of a float key follows from the anchors around it, so a range never ends on one, except at the ends of the
// list.
int WidenOverFloatKeys(KFS_StreamKeyData const* data, Range* range)
{
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(data->keys, error);
        int const lastKey = KFSp_ItemCount(data) - 1;
        while (error.None() && range->first > 0 && IsFloatKey(data, range->first, error)) --range->first;
        while (error.None() && range->last < lastKey && IsFloatKey(data, range->last, error)) ++range->last;
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
    if (IsSpatial() && !mark.IsNone()) code = WidenOverFloatKeys(data, &mark);
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
