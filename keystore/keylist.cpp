// The list side of keys, in step with their packed times.

#include "keystore/keylist_private.h"

#include "keystore/valuedata_private.h"

#include <utility>

namespace {

// Only `time` of a probe is ever compared.
KFS_KeyScalar MakeProbe(int time)
{
    KFS_KeyScalar probe{};
    probe.time = time;
    return probe;
}

int SearchList(KFS_StreamKeyData const* data, int time, bool* found, int* index)
{
    KFS_KeyScalar const probe = MakeProbe(time);
    unsigned char foundByte = 0;
    int const code = SEQ_GetSortedConstItem(data->keys, 0, 0, &probe, &foundByte, 0, index);
    *found = foundByte != 0;
    return code;
}

// A stale key that an insertion has moved up stays in its range.
void KeepMarked(int* range, int inserted)
{
    if (range[1] != KFS_INVALID_INDEX && range[1] >= inserted) ++range[1];
}

int DisposeRemapTableOfItem(SEQ_Head**, long, int, void* item)
{
    return KFSp_DisposeRemapTable(static_cast<KFS_KeyScalar*>(item));
}

}  // namespace

// Builds the packed times, and searches the list itself where there is no memory for them.
int KFSp_SearchKeyList(KFS_StreamKeyData const* data, int time, bool* found, int* index)
{
    *found = false;
    *index = 0;
    if (!data->keys) return 0;
    return data->times.Build(data->keys) ? KFSp_SearchKeys(data, time, found, index)
                                         : SearchList(data, time, found, index);
}

int KFSp_InsertKeyItem(KFS_StreamKeyData* data, KFS_KeyScalar const* record, int index)
{
    bool const mirrors = data->times.Mirrors((*data->keys)->count);
    int const code = SEQ_InsertCopy(record, index, data->keys, 0);
    if (code != 0) return code;
    if (mirrors) data->times.Inserted(index, record->time);
    KeepMarked(data->invalidKeyIndex, index);
    KeepMarked(data->arcInvalidKeyIndex, index);
    return 0;
}

int KFSp_RemoveKeyItem(KFS_StreamKeyData* data, int index, KFS_KeyScalar* record)
{
    bool const mirrors = data->times.Mirrors((*data->keys)->count);
    int const code = SEQ_Remove(index, data->keys, 0, record);
    if (code == 0 && mirrors) data->times.Removed(index);
    return code;
}

int KFSp_ReplaceKeyItem(KFS_StreamKeyData* data, KFS_KeyScalar const* record, int index)
{
    int const code = SEQ_SetItemCopy(record, index, data->keys, 0, 0);
    if (code == 0 && data->times.Mirrors((*data->keys)->count)) data->times.Retimed(index, record->time);
    return code;
}

void KFSp_RetimeKey(KFS_StreamKeyData* data, int index, KFS_KeyScalar* key, int time)
{
    key->time = time;
    if (data->times.Mirrors((*data->keys)->count)) data->times.Retimed(index, time);
}

int KFSp_DisposeRemapTable(KFS_KeyScalar* key)
{
    if (!KFSp_HasSpatialBlock(key) || !key->remapTable) return 0;
    return SEQ_Dispose(std::exchange(key->remapTable, nullptr), 0);
}

int KFSp_DisposeRemapTables(SEQ_Head** keys)
{
    // Most lists have no table, and each list ends here: a look at each record's flags is all that it may cost.
    if (KFSp_HasShortcuts && keys && *keys) {
        unsigned char* item = (*keys)->items;
        for (int i = 0; i < (*keys)->count; ++i, item += (*keys)->stride)
            if (int const code = KFSp_DisposeRemapTable(reinterpret_cast<KFS_KeyScalar*>(item))) return code;
        return 0;
    }
    return SEQ_ForEach(keys, 0, DisposeRemapTableOfItem, 0);
}

void KFSp_DisposeKeyList(SEQ_Head** keys)
{
    if (keys) {
        static_cast<void>(KFSp_DisposeRemapTables(keys));
        static_cast<void>(SEQ_Dispose(keys, 0));
    }
}
