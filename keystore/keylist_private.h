#pragma once

#include "keystore/items.h"
#include "keystore/shortcuts_private.h"
#include "keystore/stream.h"

#include <climits>

// Everything that searches, inserts, removes or retimes keys goes through here, which keeps the packed times of the key
// data in step with the list (T1).

// Bytes of one record of the key list, head and value data.
inline int KFSp_KeyItemSize(KFS_ValueDesc const& desc, bool spatial, short dimension)
{
    return KFS_GetKeyScalarDataSize(&desc, spatial, dimension) +
           (spatial ? KFS_KeySpatialHeadSize + 4 : KFS_KeyHeadSize);
}

inline int KFSp_KeyItemSize(KFS_Stream const* stream)
{
    return KFSp_KeyItemSize(*stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension());
}

// Whether a record has a size that the list service can hold: its item sizes are shorts.
inline bool KFSp_KeyItemFits(KFS_ValueDesc const& desc, bool spatial, short dimension)
{
    return dimension >= 0 && KFSp_KeyItemSize(desc, spatial, dimension) <= SHRT_MAX;
}

// A caller's time as a value in the stream's scale; a null `time` is value 0.
[[nodiscard]] inline int KFSp_TimeInStream(KFS_Stream const* stream, T_Time const* time, int* value)
{
    if (!time) {
        *value = 0;
        return 0;
    }
    return T_ShortConvTime(time->value, time->scale, stream->GetTimeScale(), value);
}

// Whether the stream's records hold a client's block: no handles, and of a size that only the client's description says,
// which isn't at hand while the stream passes for a plain one.
inline bool KFSp_HasCustomRecords(KFS_Stream const* stream)
{
    return stream->IsCustom() || stream->IsTemporarilyNonCustom();
}

// The number of items of the data's list; 0 without a list.
inline int KFSp_ItemCount(KFS_StreamKeyData const* data)
{
    return data->keys ? (*data->keys)->count : 0;
}

// What GetKeyCount answers, on key data that the caller has at hand.
inline int KFSp_KeyCount(KFS_Stream const* stream, KFS_StreamKeyData const* data)
{
    if (stream->HasNoKeys()) return data->cache->time == KFS_INVALID_INDEX ? 0 : -1;
    return KFSp_ItemCount(data);
}

// Whether any key of the data waits for KFS_Stream::UpdateStream.
inline bool KFSp_IsStale(KFS_StreamKeyData const* data)
{
    return data->invalidKeyIndex[0] != KFS_INVALID_INDEX || data->invalidKeyIndex[1] != KFS_INVALID_INDEX ||
           data->arcInvalidKeyIndex[0] != KFS_INVALID_INDEX || data->arcInvalidKeyIndex[1] != KFS_INVALID_INDEX;
}

// Whether there is nothing to answer: no key, or a constant without a value.
inline bool KFSp_HasNoValue(KFS_Stream const* stream, KFS_StreamKeyData const* data)
{
    return KFSp_KeyCount(stream, data) == 0;
}

// The time at which a constant's value stands, which has one. The sentinel would say that there is no value (C1), and
// moving an empty record would say that there is one.
inline void KFSp_MoveConstant(KFS_StreamKeyData const* data, int time)
{
    if (time != KFS_INVALID_INDEX && data->cache->time != KFS_INVALID_INDEX) data->cache->time = time;
}

// Marks all of `count` keys as stale in one of the two ranges.
inline void KFSp_MarkAllKeys(int (&range)[2], int count)
{
    range[0] = count > 0 ? 0 : KFS_INVALID_INDEX;
    range[1] = count > 0 ? count - 1 : KFS_INVALID_INDEX;
}

// The key at exactly `time`: `found` and its index; or not found, and the index of the first key after it (the count
// past the end). A missing list is an empty one. Answers the list service's code.
[[nodiscard]] int KFSp_SearchKeyList(KFS_StreamKeyData const* data, int time, bool* found, int* index);
[[nodiscard]] inline int KFSp_SearchKeys(KFS_StreamKeyData const* data, int time, bool* found, int* index)
{
    if (!data->keys || !data->times.Mirrors((*data->keys)->count)) [[unlikely]] {
        bool foundInList = false;  // not the caller's own, which stay in registers that way
        int indexInList = 0;
        int const code = KFSp_SearchKeyList(data, time, &foundInList, &indexInList);
        *found = foundInList;
        *index = indexInList;
        return code;
    }
    int const position = data->times.LowerBound(time);
    *index = position;
    *found = position < (*data->keys)->count && data->times[position] == time;
    return 0;
}

// A key of the list, read-only; -1 names the last one.
[[nodiscard]] inline int KFSp_GetConstKey(KFS_StreamKeyData const* data, int index, KFS_KeyScalar const** key)
{
    void const* item = nullptr;
    int const code = SEQ_GetConstAddress(data->keys, index, &item);
    *key = static_cast<KFS_KeyScalar const*>(item);
    return code;
}

// The same for writing what is derived, or under an edit's pin.
[[nodiscard]] inline int KFSp_GetKey(KFS_StreamKeyData const* data, int index, KFS_KeyScalar** key)
{
    KFS_KeyScalar const* item = nullptr;
    int const code = KFSp_GetConstKey(data, index, &item);
    *key = const_cast<KFS_KeyScalar*>(item);
    return code;
}

// Whether a key is flagged as one whose time follows from its neighbours.
inline bool KFSp_Floats(KFS_KeyScalar const* key)
{
    return (key->flags & KFS_KeyFlag_Float) != 0;
}

// The same of the key at an index; false where there is none.
inline bool KFSp_FloatsAt(KFS_StreamKeyData const* data, int index)
{
    KFS_KeyScalar const* key = nullptr;
    return KFSp_GetConstKey(data, index, &key) == 0 && KFSp_Floats(key);
}

// Whether its time does follow from them: the first and the last key are anchors, whatever their flags say.
inline bool KFSp_Roves(KFS_StreamKeyData const* data, KFS_KeyScalar const* key, int index)
{
    return KFSp_Floats(key) && index > 0 && index < KFSp_ItemCount(data) - 1;
}

// KFSp_GetItemPair of keys.
struct KFSp_KeyPair {
    KFS_KeyScalar const* a;
    KFS_KeyScalar const* b;
};
[[gnu::always_inline]] inline KFSp_KeyPair KFSp_GetKeyPair(KFS_StreamKeyData const* data, int index)
{
    auto const [first, second] = KFSp_GetItemPair(data->keys, index);
    return {static_cast<KFS_KeyScalar const*>(first), static_cast<KFS_KeyScalar const*>(second)};
}

// Inserts a copy of `record` so that it stands at `index`; the list exists.
[[nodiscard]] int KFSp_InsertKeyItem(KFS_StreamKeyData* data, KFS_KeyScalar const* record, int index);
// Removes a key; `record`, if not null, takes it over without disposal.
[[nodiscard]] int KFSp_RemoveKeyItem(KFS_StreamKeyData* data, int index, KFS_KeyScalar* record);
// Replaces the key by a copy of `record`, disposing the old one.
[[nodiscard]] int KFSp_ReplaceKeyItem(KFS_StreamKeyData* data, KFS_KeyScalar const* record, int index);
// Writes the time of the key at `index`, which `key` points to. The caller keeps the list sorted.
void KFSp_RetimeKey(KFS_StreamKeyData* data, int index, KFS_KeyScalar* key, int time);

// Disposes the arc table that a key owns, if it has one.
[[nodiscard]] int KFSp_DisposeRemapTable(KFS_KeyScalar* key);
// The same for all keys of a list.
[[nodiscard]] int KFSp_DisposeRemapTables(SEQ_Head** keys);

// Disposes a list of keys with the arc tables that they own; null is fine. There is nobody to tell of a failure.
void KFSp_DisposeKeyList(SEQ_Head** keys);
