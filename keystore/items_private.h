#pragma once

#include "keystore/items.h"
#include "keystore/stream.h"

// The key list's item functions, and the item functions that stand in where a stream has none of its own.

// Makes the stream's key list, unless it has one. Answers the list service's code.
[[nodiscard]] int KFSp_CreateKeyList(KFS_Stream* stream);
// Makes an empty list of the kind that the stream's keys live in, for keeping keys aside. The caller disposes it.
[[nodiscard]] int KFSp_NewKeyList(KFS_Stream* stream, SEQ_Head*** list);
// Tells the list which item functions to call, after the stream's have changed, and which stream it belongs to. 0
// without a list.
[[nodiscard]] int KFSp_SetKeyFuncs(KFS_Stream* stream);

// Order by time: a minus b, as signed 32-bit numbers with wrap-around.
int KFSp_SortKeyItemFunc(void* refcon, SEQ_Head const* const* list, void const* a, void const* b);
// The same for records in a file's layout, whose first word is the time too.
int KFSp_SortKeyItemDiskFunc(void* refcon, SEQ_Head const* const* list, void const* a, void const* b);
// Makes a copy of a key that shares nothing: an arc table stays with its key. For lists of streams with a copy
// function.
[[nodiscard]] int KFSp_CopyKeyItemFunc(void* refcon, SEQ_Head const* const* list, void const* source,
                                       void* destination);
// Gives back what a key's value owns; not its arc table. For lists of streams with a dispose function.
[[nodiscard]] int KFSp_DisposeKeyItemFunc(void* refcon, SEQ_Head** list, void* item);

// Item functions (KFS_CopyItemFunc). `kind` is a KFS_Item and says how many elements there are; the word is not looked
// at.
//
// External elements to doubles, without legalising. Operation 81, KFS_Err_CustomValue on a custom stream.
[[nodiscard]] int KFSp_ConvertItemToFloat(KFS_Stream const* stream, long refcon, short kind, void const* source,
                                          void* destination);
// Doubles to external elements. Operation 80, KFS_Err_CustomValue on a custom stream.
[[nodiscard]] int KFSp_ConvertItemFromFloat(KFS_Stream const* stream, long refcon, short kind, void const* source,
                                            void* destination);
// The bytes as they are, which may overlap; then, unless it is a single component, a float-based stream forces the
// value into its limits and may fail.
[[nodiscard]] int KFSp_FakeCopyItemFunc(KFS_Stream const* stream, long refcon, short kind, void const* source,
                                        void* destination);
// The bytes as they are.
[[nodiscard]] int KFSp_FakeCopyItemFuncNoLimits(KFS_Stream const* stream, long refcon, short kind, void const* source,
                                                void* destination);

// What a copy function of a stream's is handed: ours the stream as this thread sees it, a client's the one that the
// client knows.
inline KFS_Stream const* KFSp_HandedTo(KFS_CopyItemFunc func, KFS_Stream const* seen)
{
    bool const isOurs = func == KFSp_ConvertItemFromFloat || func == KFSp_FakeCopyItemFunc ||
                        func == KFSp_ConvertItemToFloat || func == KFSp_FakeCopyItemFuncNoLimits;
    return isOurs ? seen : seen->GetOriginal();
}

// What brings a value from a record into external form: the stream's own copy function, or what stands in for it.
inline KFS_CopyItemFunc KFSp_OutwardFunc(KFS_Stream const* stream)
{
    if (KFS_CopyItemFunc const own = stream->GetCopyItemFunc()) return own;
    return stream->IsCustom() ? KFSp_FakeCopyItemFunc : KFSp_ConvertItemFromFloat;
}
