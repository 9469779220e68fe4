// Takes a failed copying of keys back: needs no memory, because it may be memory that ran out.

#include "keystore/copyundo_private.h"

#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/valuedata_private.h"

KFSp_CopyUndo::KFSp_CopyUndo(KFS_Stream* stream, KFS_StreamKeyData* data, int count) noexcept
    : stream_(stream),
      data_(data),
      steps_(static_cast<std::size_t>(count) * sizeof(Step))
{}

KFSp_CopyUndo::~KFSp_CopyUndo()
{
    if (kept_) static_cast<void>(SEQ_Dispose(kept_, 0));  // gone in any case, and a destructor has nobody to tell
}

int KFSp_CopyUndo::Code() const noexcept
{
    return steps_.get() ? 0 : KFS_Err_OutOfMemory;
}

int KFSp_CopyUndo::Note(int time)
{
    bool found = false;
    int index = 0;
    if (int const code = KFSp_SearchKeys(data_, time, &found, &index)) return code;
    if (found) {
        if (int const code = Keep(index)) return code;
    }
    static_cast<Step*>(steps_.get())[stepCount_++] = {time, KFS_INVALID_INDEX, found};
    return 0;
}

void KFSp_CopyUndo::Put(int index) noexcept
{
    static_cast<Step*>(steps_.get())[stepCount_ - 1].index = index;
}

int KFSp_CopyUndo::Keep(int index)
{
    if (!kept_) {
        if (int const code = KFSp_NewKeyList(stream_, &kept_)) return code;
    }
    KFS_KeyScalar const* key = nullptr;
    if (int const code = KFSp_GetConstKey(data_, index, &key)) return code;
    return SEQ_InsertCopy(key, -1, kept_, 0);
}

void KFSp_CopyUndo::Undo()
{
    while (stepCount_ > 0) TakeBack(static_cast<Step const*>(steps_.get())[--stepCount_]);
    KFSp_MarkAllKeys(data_->invalidKeyIndex, KFSp_ItemCount(data_));
    KFSp_MarkAllKeys(data_->arcInvalidKeyIndex, KFSp_ItemCount(data_));
}

void KFSp_CopyUndo::TakeBack(Step const& step)
{
    int index = step.index;
    bool found = index != KFS_INVALID_INDEX;
    if (!found && KFSp_SearchKeys(data_, step.time, &found, &index) != 0) return;
    if (!found) return;  // the copy never got in
    if (step.overwrites) {
        PutBack(index);
        return;
    }
    // A listener that read in the middle may have had the key's arc measured.
    KFS_KeyScalar* key = nullptr;
    if (KFSp_GetKey(data_, index, &key) == 0) static_cast<void>(KFSp_DisposeRemapTable(key));
    static_cast<void>(KFSp_RemoveKeyItem(data_, index, nullptr));
}

// The kept key moves into the place of the one that stands there now, whose arc table it takes over. Needs no memory.
void KFSp_CopyUndo::PutBack(int index)
{
    KFS_KeyScalar* key = nullptr;
    if (KFSp_GetKey(data_, index, &key) != 0) return;
    bool const hasTable = KFSp_HasSpatialBlock(key);
    SEQ_Head** const table = hasTable ? key->remapTable : nullptr;
    static_cast<void>(KFSp_DisposeKeyItemFunc(stream_, data_->keys, key));
    static_cast<void>(SEQ_Remove((*kept_)->count - 1, kept_, 0, key));
    if (hasTable) key->remapTable = table;
    KFSp_RetimeKey(data_, index, key, key->time);
}
