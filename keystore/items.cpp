// The key list: how it is made, and what it calls for its items.

#include "keystore/check_private.h"
#include "keystore/items_private.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cstring>

namespace {

KFS_Stream* OwnerOf(SEQ_Head const* const* list)
{
    return static_cast<KFS_Stream*>((*list)->refcon);
}

// Records differ in their first word alone where order is concerned.
int TimeOf(void const* record)
{
    int time;
    std::memcpy(&time, record, sizeof time);
    return time;
}

// Bytes of a block that every copy function is sure to write, at most a word: what a copied record gets beside its
// head.
std::size_t LeadingBytes(KFS_Stream const* stream)
{
    int const bytes =
        stream->IsTemporarilyNonCustom()
            ? stream->GetDimension() * static_cast<int>(sizeof(double))
            : KFS_GetKeyScalarDataSize(stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension());
    return static_cast<std::size_t>(std::clamp(bytes, 0, 8));
}

}  // namespace

int KFS_GetKeyScalarDataSize(KFS_ValueDesc const* desc, unsigned char spatial, short dimension)
{
    if (desc->isCustom) return desc->itemSize;
    return static_cast<int>(sizeof(double)) * (spatial ? 3 : 5) * dimension;
}

int KFSp_NewKeyList(KFS_Stream* stream, SEQ_Head*** list)
{
    SEQ_Head** made = nullptr;
    if (int const code = SEQ_New(0, static_cast<short>(KFSp_KeyItemSize(stream)), 4, 1, &made)) return code;
    (*made)->refcon = const_cast<KFS_Stream*>(stream->GetKeyData()->stream);  // K7
    SEQ_Funcs const funcs{stream->GetCopyItemFunc() ? KFSp_CopyKeyItemFunc : nullptr,
                          stream->GetDisposeItemFunc() ? KFSp_DisposeKeyItemFunc : nullptr, KFSp_SortKeyItemFunc};
    if (int const code = SEQ_SetFuncs(made, 3, &funcs)) {
        static_cast<void>(SEQ_Dispose(made, 0));  // the first error wins
        return code;
    }
    *list = made;
    return 0;
}

int KFSp_CreateKeyList(KFS_Stream* stream)
{
    if (stream->GetKeys()) return 0;
    SEQ_Head** list = nullptr;
    int const code = KFSp_NewKeyList(stream, &list);
    if (code == 0) stream->SetKeys(list);
    return code;
}

int KFSp_SetKeyFuncs(KFS_Stream* stream)
{
    SEQ_Head** const list = stream->GetKeys();
    if (!list) return 0;
    stream->ShowChangeInCopy();                                               // of the functions, by which it is called
    (*list)->refcon = const_cast<KFS_Stream*>(stream->GetKeyData()->stream);  // K7
    SEQ_Funcs funcs{SEQ_RemoveFunc, SEQ_RemoveFunc, nullptr};
    if (stream->GetCopyItemFunc()) funcs.copy = KFSp_CopyKeyItemFunc;
    if (stream->GetDisposeItemFunc()) funcs.dispose = KFSp_DisposeKeyItemFunc;
    return SEQ_SetFuncs(list, 3, &funcs);
}

int KFSp_SortKeyItemFunc(void*, SEQ_Head const* const*, void const* a, void const* b)
{
    return KFSp_TimeDifference(TimeOf(a), TimeOf(b));
}

int KFSp_SortKeyItemDiskFunc(void* refcon, SEQ_Head const* const* list, void const* a, void const* b)
{
    return KFSp_SortKeyItemFunc(refcon, list, a, b);
}

int KFSp_CopyKeyItemFunc(void*, SEQ_Head const* const* list, void const* source, void* destination)
{
    KFS_Stream const* const stream = OwnerOf(list);
    auto const* const from = static_cast<KFS_KeyScalar const*>(source);
    auto* const to = static_cast<KFS_KeyScalar*>(destination);
    auto const head = static_cast<std::size_t>(KFSp_ValueDataOffset(from));
    std::memcpy(destination, source, head + (KFSp_HasSpatialBlock(from) ? LeadingBytes(stream) : 0));
    if (KFSp_HasSpatialBlock(from)) to->remapTable = nullptr;  // K5
    KFS_CopyItemFunc const own = stream->GetCopyItemFunc();
    KFS_CopyItemFunc const copy = own ? own : KFSp_FakeCopyItemFunc;
    return copy(KFSp_HandedTo(copy, stream), stream->GetItemRefcon(), KFS_Item_KeyWhole, KFSp_ValueData(from),
                KFSp_ValueData(to));
}

int KFSp_DisposeKeyItemFunc(void*, SEQ_Head** list, void* item)
{
    KFS_Stream const* const stream = OwnerOf(list);
    KFS_DisposeItemFunc const dispose = stream->GetDisposeItemFunc();
    if (!dispose) return 0;
    return dispose(stream->GetOriginal(), stream->GetItemRefcon(), KFS_Item_KeyWhole,
                   KFSp_ValueData(static_cast<KFS_KeyScalar*>(item)));
}

int KFS_DisposeRemapTables(KFS_Stream* stream)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_DisposeRemapTables, stream, KFSp_Row_Dispose)) return code;
        KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
        if (!stream->IsSpatial() || stream->HasNoKeys() || KFSp_ItemCount(data) == 0) return 0;
        KFSp_FirstError error;
        {
            KFSp_ScPin const pin(data->keys, error);
            if (error.None()) error.Keep(KFSp_DisposeRemapTables(data->keys));
        }
        if (error.None()) KFSp_MarkAllKeys(data->arcInvalidKeyIndex, KFSp_ItemCount(data));
        return error.Code();
    });
}
