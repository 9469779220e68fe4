// Keys from stream to stream. What takes a failed copying back stands in copyundo.cpp.

#include "keystore/copykeys.h"

#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/copyundo_private.h"
#include "keystore/edit.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/savedrecords_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <climits>
#include <cstring>

namespace {

struct Route {
    KFS_Stream const* source;
    KFS_StreamKeyData const* from;
    KFS_Stream* destination;
    KFS_StreamKeyData* to;
};

int DataSize(KFS_Stream const* stream)
{
    return KFS_GetKeyScalarDataSize(stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension());
}

// A record's value data, as many bytes of it as the destination's records have: a shorter one is followed by zeros. What
// the bytes mean isn't looked at.
class FittedData {
public:
    FittedData(Route const& route, KFS_KeyScalar const* record)
        : data_(KFSp_ValueData(record)),
          zeros_(IsShort(route) ? static_cast<std::size_t>(DataSize(route.destination)) : 0)
    {
        if (!IsShort(route)) return;
        int const held =
            std::min(DataSize(route.source), KFSp_KeyItemSize(route.source) - KFSp_ValueDataOffset(record));
        if (zeros_.get() && held > 0) std::memcpy(zeros_.get(), data_, static_cast<std::size_t>(held));
        data_ = zeros_.get();
    }

    // Null when out of memory.
    void const* get() const { return data_; }

private:
    static bool IsShort(Route const& route) { return DataSize(route.source) < DataSize(route.destination); }

    void const* data_;
    KFSp_ScBytes zeros_;
};

int CheckStreams(KFS_Stream const* source, KFS_Stream const* destination, short operation)
{
    if (int const code = KFSp_CheckStream(operation, source, KFSp_Row_CopyKeyFrom)) return code;
    return KFSp_CheckStream(operation, destination, KFSp_Row_CopyKeyTo);
}

// Tangents and float times that are copied have to be right.
int BringUpToDate(Route const& route)
{
    return route.source->HasKeys() ? route.source->UpdateStream() : 0;
}

// The record's number block into the destination's cache record; a custom destination takes a value alone.
int SetupCopy(Route const& route, KFS_KeyScalar const* record, int time)
{
    FittedData const data(route, record);
    if (!data.get()) return KFS_Err_OutOfMemory;
    short const kind = route.destination->IsCustom() ? KFS_Item_KeyValue : KFS_Item_KeyWhole;
    return KFSp_SetupCache(route.destination, time, data.get(), static_cast<char>(record->inInterp),
                           static_cast<char>(record->outInterp), kind, 0);
}

// All flags but the one that says how the destination's own records are laid out.
void CopyFlags(KFS_KeyScalar const* record, KFS_KeyScalar* copy)
{
    constexpr unsigned int layout = KFS_KeyFlag_SpatialBlock;
    copy->flags = static_cast<unsigned short>((record->flags & ~layout) | (copy->flags & layout));
}

void CopySpatialBlock(KFS_KeyScalar const* record, KFS_KeyScalar* copy)
{
    if (!KFSp_HasSpatialBlock(record) || !KFSp_HasSpatialBlock(copy)) return;
    copy->spFlags = record->spFlags;
    copy->arcLength = record->arcLength;
    copy->inSpeed = record->inSpeed;
    copy->inInfluence = record->inInfluence;
    copy->outSpeed = record->outSpeed;
    copy->outInfluence = record->outInfluence;
}

// A key's time in another stream. The sentinel isn't a time that a key can have.
int TimeAtDestination(Route const& route, int operation, short row, T_Time const& time, int* value)
{
    T_Time converted = time;
    if (time.scale != route.destination->GetTimeScale()) {
        if (int const code = T_ConvTime(&time, route.destination->GetTimeScale(), &converted, 0)) return code;
    }
    *value = converted.value;
    return converted.value != KFS_INVALID_INDEX ? 0 : KFSp_ReportErr(operation, KFS_Err_TimeNotRepresentable, row);
}

void HoldOnly(Route const& route)
{
    if (route.destination->GetInterpMask() != KFS_InterpMask_Hold) return;
    route.to->cache->inInterp = KFS_Interp_Hold;
    route.to->cache->outInterp = KFS_Interp_Hold;
}

int AssembleCopy(Route const& route, KFS_KeyScalar const* record, int time)
{
    KFSp_FirstError error;
    error.Keep(SetupCopy(route, record, time));
    if (error.None()) {
        error.Keep(KFSp_Boundary(
            [&] { route.destination->PrepareForInsertOfForeignValue(const_cast<KFS_Stream*>(route.source)); }));
    }
    KFS_KeyScalar* const cache = route.to->cache;
    HoldOnly(route);
    if (error.None()) {
        CopyFlags(record, cache);
        CopySpatialBlock(record, cache);
    }
    return error.Code();
}

// The destination's one value is put aside until the copy has taken its place.
class SavedConstant {
public:
    explicit SavedConstant(KFS_Stream* stream) : stream_(stream), cache_(stream) {}

    int Code() const { return cache_.Code(); }
    // Ends it: the old value is given back, or is in its place again.
    int End(bool replaced)
    {
        if (!replaced) {
            cache_.Restore();
            return 0;
        }
        KFS_DisposeItemFunc const dispose = stream_->GetDisposeItemFunc();
        if (!dispose || KFSp_CacheIsEmpty(cache_.get())) return 0;
        return dispose(stream_, stream_->GetItemRefcon(), KFS_Item_CacheWhole, KFSp_ValueData(cache_.get()));
    }

private:
    KFS_Stream* stream_;
    KFSp_SavedCache cache_;
};

int PutCopy(Route const& route, KFS_KeyScalar const* record, int time, bool replace, int* index)
{
    KFSp_FirstError error;
    error.Keep(AssembleCopy(route, record, time));
    KFSp_PutKey const how{.overwrite = replace, .valueGiven = true, .tangentsGiven = true};
    if (error.None()) error.Keep(KFSp_PutKeyFromCache(route.destination, how, index));
    return error.Code();
}

int CopyToConstant(Route const& route, KFS_KeyScalar const* record, int time, bool replace, int* index)
{
    if (!KFSp_CacheIsEmpty(route.to->cache) && !replace)
        return KFSp_ReportErr(KFSp_Op_InsertKey, KFS_Err_KeyValue, KFSp_Row_OverwriteKey);
    if (record == route.to->cache) {  // onto itself: it moves
        KFSp_MoveConstant(route.to, time);
        HoldOnly(route);
        *index = 0;
        return 0;
    }
    SavedConstant old(route.destination);
    if (old.Code() != 0) return old.Code();
    KFSp_FirstError error;
    error.Keep(PutCopy(route, record, time, replace, index));
    error.Keep(KFSp_Boundary([&] { return old.End(error.None()); }));
    return error.Code();
}

int CopyToKeys(Route const& route, KFS_KeyScalar const* record, int time, bool replace, int* index)
{
    if (int const code = KFSp_ClearCache(route.destination)) return code;
    int const code = PutCopy(route, record, time, replace, index);
    route.to->cache->time = KFS_INVALID_INDEX;  // what it holds is the source's
    return code;
}

int CopyRecord(Route const& route, KFS_KeyScalar const* record, bool replace, T_Time const* time, int* index)
{
    T_Time const own{route.source->HasNoKeys() ? 0 : record->time, route.source->GetTimeScale()};
    int at = 0;
    if (int const code = TimeAtDestination(route, KFSp_Op_CopyKey, KFSp_Row_CopyKeyTo, time ? *time : own, &at))
        return code;
    return route.destination->HasNoKeys() ? CopyToConstant(route, record, at, replace, index)
                                          : CopyToKeys(route, record, at, replace, index);
}

int CopyKey(Route const& route, int index, bool replace, T_Time const* time, int* newIndex)
{
    if (KFSp_HasNoValue(route.source, route.from))
        return KFSp_ReportErr(KFSp_Op_CopyKey, KFS_Err_NoKeys, KFSp_Row_CopyKeyFrom);
    if (int const code = BringUpToDate(route)) return code;
    if (route.source->HasNoKeys()) return CopyRecord(route, route.from->cache, replace, time, newIndex);
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(route.from->keys, index, error);
        if (error.None()) error.Keep(CopyRecord(route, key.get(), replace, time, newIndex));
    }
    return error.Code();
}

// The spatial block of a copy that stands in the list. Listeners have heard of it before, and what one of them has read,
// and so repaired, was without the block.
int FinishCopy(Route const& route, KFS_KeyScalar const* record, KFS_KeyScalar const& head, int newIndex)
{
    KFS_KeyScalar* copy = nullptr;
    if (int const code = KFSp_GetKey(route.to, newIndex, &copy)) return code;
    if (!KFSp_HasSpatialBlock(&head) || !KFSp_HasSpatialBlock(copy)) return 0;
    CopySpatialBlock(&head, copy);
    KFSp_FirstError error;
    // The arc table of a key that was overwritten belongs to the arc that was there.
    if (copy != record) error.Keep(KFSp_DisposeRemapTable(copy));
    error.Keep(KFSp_ClearCache(route.destination));
    error.Keep(route.destination->SetInvalid(newIndex + 1, 2));
    error.Keep(route.destination->SetArcInvalid(newIndex + 2, 4));
    return error.Code();
}

int CopyOneKey(Route const& route, int index, KFSp_CopyUndo& undo)
{
    KFS_KeyScalar const* record = nullptr;
    if (int const code = KFSp_GetConstKey(route.from, index, &record)) return code;
    int at = 0;
    if (int const code = TimeAtDestination(route, KFSp_Op_CopyKeys, KFSp_Row_CopyKeyTo,
                                           {record->time, route.source->GetTimeScale()}, &at))
        return code;
    if (int const code = undo.Note(at)) return code;
    // Within one stream the record is about to be written over.
    KFS_KeyScalar head{};
    std::memcpy(static_cast<void*>(&head), record, static_cast<std::size_t>(KFSp_ValueDataOffset(record)));
    // Whoever heard of the key before may have read, and the record owns a value then.
    if (int const code = KFSp_ClearCache(route.destination)) return code;
    if (int const code = SetupCopy(route, record, at)) {
        route.to->cache->time = KFS_INVALID_INDEX;  // what it holds is the source's
        return code;
    }
    CopyFlags(record, route.to->cache);
    int newIndex = KFS_INVALID_INDEX;
    int const code = KFSp_InsertKeyFromCache(1, 1, 1, 0, route.destination, &newIndex);
    undo.Put(newIndex);
    return code != 0 ? code : FinishCopy(route, record, head, newIndex);
}

// The n-th key to be copied.
int KeyIndexOf(SEQ_Head const* const* keys, int n, int* index)
{
    if (!keys) {
        *index = n;
        return 0;
    }
    void const* item = nullptr;
    int const code = SEQ_GetConstAddress(keys, n, &item);
    if (code == 0) std::memcpy(index, item, sizeof *index);
    return code;
}

// Room for all of them at once; the spare room goes back at the end.
int ReserveKeys(Route const& route, int count)
{
    long long const wanted = static_cast<long long>(KFSp_ItemCount(route.to)) + count;
    return SEQ_ReserveSpace(static_cast<int>(std::min<long long>(wanted, INT_MAX)), route.to->keys);
}

int CopyKeysPinned(Route const& route, SEQ_Head const* const* keys, int count, KFSp_CopyUndo& undo)
{
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const sourcePin(route.from->keys, error);
        KFSp_ScPin const destinationPin(route.to->keys, error);
        for (int n = 0; error.None() && n < count; ++n) {
            int index = 0;
            error.Keep(KeyIndexOf(keys, n, &index));
            if (error.None()) error.Keep(CopyOneKey(route, index, undo));
        }
    }
    return error.Code();
}

// All or none: what came before a failure is taken back.
int CopyIntoKeys(Route const& route, SEQ_Head const* const* keys)
{
    int const count = keys ? (*keys)->count : KFSp_ItemCount(route.from);
    KFSp_FirstError error;
    error.Keep(KFSp_ClearCache(route.destination));
    if (error.None()) error.Keep(KFSp_CreateKeyList(route.destination));
    if (error.None()) error.Keep(ReserveKeys(route, count));
    if (!error.None()) return error.Code();
    KFSp_CopyUndo undo(route.destination, route.to, count);
    error.Keep(undo.Code());
    if (error.None()) {
        error.Keep(CopyKeysPinned(route, keys, count, undo));
        if (!error.None()) {
            undo.Undo();
            static_cast<void>(KFSp_ClearCache(route.destination));  // of what was read with keys that are gone
            // Listeners may have heard of keys that are gone again. Nothing that they answer matters any more.
            static_cast<void>(KFSp_Boundary([&] { route.destination->NotifyValueChanged(); }));
        }
    }
    // Room that can't be given back is no failure of the copy.
    static_cast<void>(SEQ_Compact(route.to->keys));
    return error.Code();
}

int CopyConstant(Route const& route)
{
    KFS_KeyScalar const* const record = route.from->cache;
    KFS_Stream* const destination = route.destination;
    T_Time const time{0, route.source->GetTimeScale()};
    char const in = static_cast<char>(record->inInterp);
    char const out = static_cast<char>(record->outInterp);
    FittedData const data(route, record);
    if (!data.get()) return KFS_Err_OutOfMemory;
    if (destination->IsCustom()) return KFS_InsertKey(destination, &time, 1, data.get(), in, out);
    if (int const code = KFS_InsertKeyF(destination, &time, 1, static_cast<double const*>(data.get()), in, out))
        return code;
    if (destination->HasNoKeys() && destination->GetValueDesc()->dataType != KFS_Type_Double &&
        record != route.to->cache)
        std::memcpy(KFSp_ValueData(route.to->cache), data.get(), static_cast<std::size_t>(DataSize(destination)));
    return 0;
}

int CopyKeys(Route const& route, SEQ_Head const* const* keys)
{
    if (keys && (*keys)->count == 0) return 0;
    if (KFSp_HasNoValue(route.source, route.from))
        return KFSp_ReportErr(KFSp_Op_CopyKeys, KFS_Err_NoKeys, KFSp_Row_CopyKeyFrom);
    if (route.source->HasNoKeys()) return CopyConstant(route);
    if (route.destination->HasNoKeys()) return KFSp_ReportErr(KFSp_Op_CopyKeys, KFS_Err_Constant, KFSp_Row_CopyKeyTo);
    if (int const code = BringUpToDate(route)) return code;
    return CopyIntoKeys(route, keys);
}

}  // namespace

int KFS_CopyKey(KFS_Stream* source, int index, unsigned char replace, T_Time const* time, KFS_Stream* destination,
                int* newIndex)
{
    if (newIndex) *newIndex = KFS_INVALID_INDEX;
    if (int const code = CheckStreams(source, destination, KFSp_Op_CopyKey)) return code;
    int made = KFS_INVALID_INDEX;
    int const code = KFSp_Boundary([&] {
        Route const route{source, source->GetKeyData(), destination, destination->GetKeyDataForModify()};
        return CopyKey(route, index, replace != 0, time, &made);
    });
    if (code != 0) return code;
    if (newIndex) *newIndex = made;
    return KFSp_Boundary([&] { destination->NotifyValueChanged(); });
}

int KFS_CopyKeys(KFS_Stream const* source, SEQ_Head** keys, KFS_Stream* destination)
{
    if (int const code = CheckStreams(source, destination, KFSp_Op_CopyKeys)) return code;
    return KFSp_Boundary([&] {
        return CopyKeys({source, source->GetKeyData(), destination, destination->GetKeyDataForModify()}, keys);
    });
}
