// Inserting, changing and removing a key, in external form and as doubles. How a key enters the list: insertfromcache.cpp.

#include "keystore/edit.h"

#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/plainkeys_private.h"
#include "keystore/savedrecords_private.h"
#include "keystore/valuedata_private.h"

#include <cstring>

namespace {

// Bytes of the value alone in a record.
std::size_t ValueSize(KFS_Stream const* stream)
{
    return stream->IsCustom() ? stream->GetValueDesc()->itemSize
                              : static_cast<std::size_t>(stream->GetDimension()) * sizeof(double);
}

// Bytes of a record's value data that are known to be there.
std::size_t DataSize(KFS_Stream const* stream)
{
    return KFSp_HasCustomRecords(stream) ? ValueSize(stream)
                                         : static_cast<std::size_t>(KFS_GetKeyScalarDataSize(
                                               stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension()));
}

int DisposeValue(KFS_Stream const* stream, short kind, void* value)
{
    KFS_DisposeItemFunc const dispose = stream->GetDisposeItemFunc();
    return dispose ? KFSp_Boundary([&] { return dispose(stream, stream->GetItemRefcon(), kind, value); }) : 0;
}

int Notify(KFS_Stream* stream)
{
    return KFSp_Boundary([stream] { stream->NotifyValueChanged(); });
}

// The record as a key about to be inserted. Nothing that it held before is left in it, but the value where `keepValue`
// says so.
int AssembleKey(KFS_Stream* stream, int time, void const* value, bool keepValue, char inInterp, char outInterp)
{
    int const code = KFSp_SetupCache(stream, time, value, inInterp, outInterp, KFS_Item_KeyValue, 1);
    KFS_KeyScalar* const cache = stream->GetCache();
    if (KFSp_HasSpatialBlock(cache)) {
        cache->arcLength = 0.0;
        cache->inSpeed = 0.0;
        cache->inInfluence = 0.0;
        cache->outSpeed = 0.0;
        cache->outInfluence = 0.0;
    }
    auto* const data = static_cast<char*>(KFSp_ValueData(cache));
    if (!value && !keepValue) std::memset(data, 0, ValueSize(stream));
    std::memset(data + ValueSize(stream), 0, DataSize(stream) - ValueSize(stream));
    return code;
}

// The new value goes into the record while the old one is put aside, which comes back if anything fails and is given
// back at the end if not.
int InsertConstant(KFS_Stream* stream, int time, bool replace, void const* value, char inInterp, char outInterp)
{
    bool const hasValue = !KFSp_CacheIsEmpty(stream->GetCache());
    if (hasValue && !replace) return KFSp_ReportErr(KFSp_Op_InsertKey, KFS_Err_KeyValue, KFSp_Row_OverwriteKey);
    KFSp_ScBytes const old(DataSize(stream));
    if (!old.get()) return KFS_Err_OutOfMemory;
    KFS_KeyScalar* const cache = stream->GetCache();
    KFS_KeyScalar head{};
    std::memcpy(static_cast<void*>(&head), cache, static_cast<std::size_t>(KFSp_ValueDataOffset(cache)));
    std::memcpy(old.get(), KFSp_ValueData(cache), DataSize(stream));

    KFSp_FirstError error;
    error.Keep(AssembleKey(stream, time, value, hasValue, inInterp, outInterp));
    if (error.None()) {
        KFSp_PutKey const how{.overwrite = replace, .valueGiven = value != nullptr, .clearCache = !value};
        error.Keep(KFSp_PutKeyFromCache(stream, how, nullptr));
    }
    if (!error.None()) {
        std::memcpy(static_cast<void*>(cache), &head, static_cast<std::size_t>(KFSp_ValueDataOffset(&head)));
        std::memcpy(KFSp_ValueData(cache), old.get(), DataSize(stream));
    } else if (hasValue && value) {
        error.Keep(DisposeValue(stream, KFS_Item_CacheWhole, old.get()));
    }
    return error.Code();
}

int InsertIntoKeys(KFS_Stream* stream, int time, bool replace, void const* value, char inInterp, char outInterp)
{
    KFSp_FirstError error;
    error.Keep(KFSp_ClearCache(stream));
    if (error.None()) {
        error.Keep(AssembleKey(stream, time, value, false, inInterp, outInterp));
        KFSp_PutKey const how{.overwrite = replace, .valueGiven = value != nullptr};
        if (error.None()) error.Keep(KFSp_PutKeyFromCache(stream, how, nullptr));
    }
    // What the record holds is the caller's value, so it isn't disposed.
    stream->GetCache()->time = KFS_INVALID_INDEX;
    return error.Code();
}

void StoreInterps(KFS_KeyScalar* record, char inInterp, char outInterp)
{
    if (inInterp != KFS_Interp_None) record->inInterp = static_cast<signed char>(inInterp);
    if (outInterp != KFS_Interp_None) record->outInterp = static_cast<signed char>(outInterp);
    if (record->inInterp != KFS_Interp_Spline && record->outInterp != KFS_Interp_Spline)
        record->flags &= static_cast<unsigned short>(~KFS_KeyFlag_Continuous);
}

// The copy is finished before the old value is given up, so a value that can't be had leaves the old one standing.
int StoreValue(KFS_Stream const* stream, KFS_KeyScalar* record, short kind, void const* value)
{
    KFSp_ScBytes const made(ValueSize(stream));
    if (!made.get()) return KFS_Err_OutOfMemory;
    KFS_CopyItemFunc const own = stream->GetCopyItemFunc();
    KFS_CopyItemFunc const copy = own ? own : KFSp_ConvertItemToFloat;
    if (int const code = KFSp_Boundary([&] { return copy(stream, stream->GetItemRefcon(), kind, value, made.get()); }))
        return code;
    if (int const code = DisposeValue(stream, kind, KFSp_ValueData(record))) {
        DisposeValue(stream, kind, made.get());
        return code;
    }
    std::memcpy(KFSp_ValueData(record), made.get(), ValueSize(stream));
    return 0;
}

int ChangeRecord(KFS_Stream* stream, KFS_KeyScalar* record, short kind, int index, void const* value, char inInterp,
                 char outInterp)
{
    StoreInterps(record, inInterp, outInterp);
    if (value) {
        if (int const code = StoreValue(stream, record, kind, value)) return code;
    }
    KFSp_FirstError error;
    error.Keep(stream->SetInvalid(index + 1, 3));
    if (stream->IsSpatial()) error.Keep(stream->SetArcInvalid(index + 2, 4));
    return error.Code();
}

int SetKey(KFS_Stream* stream, int index, void const* value, char inInterp, char outInterp)
{
    if (int const code = KFSp_CanDoInterp(stream, inInterp)) return code;
    if (int const code = KFSp_CanDoInterp(stream, outInterp)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_SetKey, KFS_Err_NoKeys, KFSp_Row_AlterKey);
    KFSp_FirstError error;
    if (stream->HasNoKeys()) {
        error.Keep(ChangeRecord(stream, data->cache, KFS_Item_CacheValue, 0, value, inInterp, outInterp));
    } else {
        error.Keep(KFSp_ClearCache(stream));
        if (error.None()) {
            KFSp_ScKey const key(data->keys, index, error);
            if (error.None())
                error.Keep(ChangeRecord(stream, key.get(), KFS_Item_KeyValue, index, value, inInterp, outInterp));
        }
    }
    return error.Code();
}

int InsertKey(KFS_Stream* stream, T_Time const* time, bool replace, void const* value, char inInterp, char outInterp)
{
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    if (at == KFS_INVALID_INDEX)
        return KFSp_ReportErr(KFSp_Op_InsertKey, KFS_Err_TimeNotRepresentable, KFSp_Row_InsertKey);
    if (stream->HasKeys()) {
        bool found = false;
        int index = 0;
        if (int const code = KFSp_SearchKeys(stream->GetKeyData(), at, &found, &index)) return code;
        if (found) {
            return replace ? SetKey(stream, index, value, inInterp, outInterp)
                           : KFSp_ReportErr(KFSp_Op_InsertKey, KFS_Err_KeyValue, KFSp_Row_OverwriteKey);
        }
    }
    if (int const code = KFSp_CanDoInterp(stream, inInterp)) return code;
    if (int const code = KFSp_CanDoInterp(stream, outInterp)) return code;
    return stream->HasNoKeys() ? InsertConstant(stream, at, replace, value, inInterp, outInterp)
                               : InsertIntoKeys(stream, at, replace, value, inInterp, outInterp);
}

// Whether a record can hold `dimension` doubles as its value. What a custom value owns must not be left beside them.
bool TakesDoubles(KFS_Stream const* stream)
{
    std::size_t const room = stream->GetValueDesc()->itemSize;
    std::size_t const wanted = static_cast<std::size_t>(stream->GetDimension()) * sizeof(double);
    return !stream->IsCustom() || room == wanted || (room > wanted && !stream->GetDisposeItemFunc());
}

// Runs an edit with a value of doubles; without a value there is nothing to describe.
template <class Edit>
int EditDoubles(KFS_Stream* stream, bool describe, Edit&& edit)
{
    if (!describe) return edit();
    if (!TakesDoubles(stream)) return KFSp_RefuseCustomValue(KFSp_Op_ConvertToFloat, KFSp_Row_ConvertTo);
    // The list's items have the size that the present description says.
    if (stream->IsCustom() && stream->HasKeys()) {
        if (int const code = KFSp_CreateKeyList(stream)) return code;
    }
    KFSp_FirstError error;
    KFSp_ScDoubleValues doubles(stream, KFSp_FakeCopyItemFunc);
    error.Keep(doubles.Code());
    if (error.None()) error.Keep(KFSp_Boundary(edit));
    error.Keep(doubles.Restore());
    return error.Code();
}

// A range of stale keys ends at the last key.
void PullIn(int* range, int keyCount)
{
    if (range[1] >= keyCount) range[1] = keyCount - 1;
}

int DisposeRemapTable(SEQ_Head** keys, int index)
{
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(keys, index, error);
        if (key.get()) error.Keep(KFSp_DisposeRemapTable(key.get()));
    }
    return error.Code();
}

}  // namespace

int KFSp_TakeKeyOut(KFS_Stream* stream, int index, bool keepInCache)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    if (!data->keys) return KFS_Err_NoKeys;
    if (index < 0 || index >= KFSp_ItemCount(data))
        return KFSp_RemoveKeyItem(data, index, nullptr);  // the list's own answer
    KFSp_FirstError error;
    if (stream->IsSpatial()) error.Keep(DisposeRemapTable(data->keys, index));
    if (keepInCache && error.None()) error.Keep(KFSp_ClearCache(stream));
    if (error.None()) error.Keep(KFSp_RemoveKeyItem(data, index, keepInCache ? data->cache : nullptr));
    error.Keep(stream->SetInvalid(index, 1));
    if (stream->IsSpatial()) static_cast<void>(stream->SetArcInvalid(index + 2, 4));
    int const keyCount = KFSp_KeyCount(stream, data);
    PullIn(data->invalidKeyIndex, keyCount);
    PullIn(data->arcInvalidKeyIndex, keyCount);
    return error.Code();
}

namespace {

// The removed key is handed out of the cache record, which a listener may write by reading; so they are told last.
int RemoveKey(KFS_Stream* stream, int index, void* value)
{
    if (!value && KFSp_RemoveLastPlainKey(stream, index)) return Notify(stream);
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_RemoveKey, KFS_Err_NoKeys, KFSp_Row_RemoveKey);
    KFSp_FirstError error;
    if (stream->HasKeys()) {
        error.Keep(KFSp_ClearCache(stream));
        if (error.None()) error.Keep(KFSp_TakeKeyOut(stream, index, value != nullptr));
    }
    bool const removed = error.None();
    if (value && !KFSp_CacheIsEmpty(data->cache)) {
        // The key is gone already, so there is nothing to be done about a failure.
        static_cast<void>(KFSp_Boundary([&] {
            return KFSp_OutwardFunc(stream)(stream, stream->GetItemRefcon(), KFS_Item_KeyValue,
                                            KFSp_ValueData(data->cache), value);
        }));
    }
    error.Keep(KFSp_ClearCache(stream));
    if (removed) error.Keep(Notify(stream));
    return error.Code();
}

bool HoldsDoubles(KFS_Stream const* stream)
{
    return (stream->GetValueDesc()->dataType & 0xFF) == KFS_Type_Double;
}

}  // namespace

// Listeners hear of it when the stream is itself again, so they aren't told in here.
int KFSp_InsertKeyF(KFS_Stream* stream, T_Time const* time, bool replace, double const* value, char inInterp,
                    char outInterp)
{
    return KFSp_Boundary([&] {
        // Values of a class with limits are forced into them on their way into the list.
        if (!stream->IsFloatBased() && KFSp_AppendPlainKey(stream, time, value, inInterp, outInterp)) return 0;
        return EditDoubles(
            stream, value != nullptr, [&] { return InsertKey(stream, time, replace, value, inInterp, outInterp); });
    });
}

int KFS_InsertKey(KFS_Stream* stream, T_Time const* time, unsigned char replace, void const* value, char inInterp,
                  char outInterp)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_InsertKey, stream, KFSp_Row_InsertKey)) return code;
    int const code = KFSp_Boundary([&] {
        if (HoldsDoubles(stream) &&
            KFSp_AppendPlainKey(stream, time, static_cast<double const*>(value), inInterp, outInterp))
            return 0;
        return InsertKey(stream, time, replace != 0, value, inInterp, outInterp);
    });
    return code != 0 ? code : Notify(stream);
}

int KFS_InsertKeyF(KFS_Stream* stream, T_Time const* time, unsigned char replace, double const* value, char inInterp,
                   char outInterp)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_InsertKeyF, stream, KFSp_Row_AlterKey)) return code;
    int const code = KFSp_InsertKeyF(stream, time, replace != 0, value, inInterp, outInterp);
    return code != 0 ? code : Notify(stream);
}

int KFS_SetKey(KFS_Stream* stream, int index, void const* value, char inInterp, char outInterp)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetKey, stream, KFSp_Row_AlterKey)) return code;
    int const code = KFSp_Boundary([&] { return SetKey(stream, index, value, inInterp, outInterp); });
    return code != 0 ? code : Notify(stream);
}

int KFS_SetKeyF(KFS_Stream* stream, int index, double const* value, char inInterp, char outInterp)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetKeyF, stream, KFSp_Row_AlterKey)) return code;
    int const code = KFSp_Boundary([&] {
        return EditDoubles(stream, value != nullptr, [&] { return SetKey(stream, index, value, inInterp, outInterp); });
    });
    return code != 0 ? code : Notify(stream);
}

int KFS_RemoveKey(KFS_Stream* stream, int index, void* value)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_RemoveKey, stream, KFSp_Row_RemoveKey)) return code;
    return KFSp_Boundary([&] { return RemoveKey(stream, index, value); });
}

int KFS_Stream::RemoveKey(int index, unsigned char keepInCache)
{
    int const code = KFSp_TakeKeyOut(this, index, keepInCache != 0);
    return code != 0 ? code : Notify(this);
}
