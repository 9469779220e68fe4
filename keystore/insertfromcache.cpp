// How the key that stands in the cache record enters the list: the one way in.

#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/curvehooks_private.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/savedrecords_private.h"
#include "keystore/valuedata_private.h"

#include <cstring>
#include <optional>

namespace {

struct Insertion {
    KFS_Stream* stream;
    KFS_StreamKeyData* data;
    KFS_KeyScalar* key;  // the cache record
    bool overwrite;
    bool valueGiven;
    bool tangentsGiven;
    bool ownsValue;  // the record's value is to be disposed at the end
    int position = KFS_INVALID_INDEX;

    // Also a custom stream that passes for a plain one for a while: its records have no room for tangents.
    bool IsCustom() const { return KFSp_HasCustomRecords(stream); }
    bool HasSplineSide() const { return key->inInterp == KFS_Interp_Spline || key->outInterp == KFS_Interp_Spline; }
    bool HasOpenSide() const { return key->inInterp == KFS_Interp_None || key->outInterp == KFS_Interp_None; }
};

int CopyItem(Insertion const& insertion, short kind, void const* source, void* destination)
{
    KFS_Stream const* const stream = insertion.stream;
    KFS_CopyItemFunc const own = stream->GetCopyItemFunc();
    KFS_CopyItemFunc const copy = own ? own : KFSp_FakeCopyItemFunc;
    return KFSp_Boundary([&] { return copy(stream, stream->GetItemRefcon(), kind, source, destination); });
}

// Splits and slopes read what is derived (arc lengths, automatic tangents) and float keys may move, so the repair comes
// before the search.
int BringUpToDate(Insertion const& insertion)
{
    bool const readsDerived = !insertion.valueGiven || (insertion.stream->IsSpatial() && !insertion.tangentsGiven &&
                                                        (insertion.HasSplineSide() || insertion.HasOpenSide()));
    if (!readsDerived || KFSp_ItemCount(insertion.data) == 0 || !KFSp_IsStale(insertion.data)) return 0;
    if (insertion.IsCustom())  // no key floats there, so the record isn't written
        return insertion.stream->IsSpatial() ? insertion.stream->UpdateStream() : 0;
    KFSp_SavedCache const record(insertion.stream);
    if (record.Code() != 0) return record.Code();
    int const code = insertion.stream->UpdateStream();
    record.Restore();
    return code;
}

// What is to be computed for the key, as the `mode` of splits and automatic tangents.
char TangentMode(Insertion const& insertion)
{
    KFS_Stream const* const stream = insertion.stream;
    bool const spatial = stream->IsSpatial();
    int mode = 0;
    if (!insertion.tangentsGiven && insertion.HasSplineSide() && (spatial || !insertion.IsCustom()))
        mode |= KFSp_Tangents_Temporal;
    bool const tangentsSet = (insertion.key->flags & KFS_KeyFlag_TangentsSet) == KFS_KeyFlag_TangentsSet;
    if (spatial && !tangentsSet && stream->GetSpInterp() == KFS_SpInterp_Auto && !insertion.IsCustom())
        mode |= KFSp_Tangents_Spatial;
    return static_cast<char>(mode);
}

void TakeBits(unsigned short* word, unsigned short bits, unsigned short from)
{
    *word = static_cast<unsigned short>((*word & ~bits) | (from & bits));
}

void DecideSide(signed char* interp, char proposed)
{
    if (*interp == KFS_Interp_None) *interp = static_cast<signed char>(proposed);
    if (*interp == KFS_Interp_None) *interp = KFS_Interp_Linear;
}

// Sides without a code take what the neighbours suggest, and flags go with that.
int DecideInterps(Insertion const& insertion)
{
    KFS_KeyScalar* const key = insertion.key;
    if (!insertion.HasOpenSide()) return 0;
    T_Time const time{key->time, insertion.stream->GetTimeScale()};
    char in = KFS_Interp_None;
    char out = KFS_Interp_None;
    unsigned short flags = 0;
    unsigned int spFlags = 0;
    if (int const code = KFSp_ChooseInterpsAndFlags(insertion.stream, &time, &in, &out, &flags, &spFlags)) return code;
    DecideSide(&key->inInterp, in);
    DecideSide(&key->outInterp, out);
    TakeBits(&key->flags, KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable, flags);
    if (insertion.stream->IsSpatial() && KFSp_HasSpatialBlock(key)) {
        constexpr unsigned int bits = KFS_KeySpFlag_Continuous | KFS_KeySpFlag_Modifiable;
        key->spFlags = (key->spFlags & ~bits) | (spFlags & bits);
    }
    return 0;
}

// A custom value at the key's time, computed in the record, which owns it from then on.
int EvaluateCustomValue(Insertion& insertion)
{
    KFS_KeyScalar const head = [&] {
        KFS_KeyScalar saved{};
        std::memcpy(static_cast<void*>(&saved), insertion.key,
                    static_cast<std::size_t>(KFSp_ValueDataOffset(insertion.key)));
        return saved;
    }();
    insertion.key->time = KFS_INVALID_INDEX;
    int const code = KFSp_Boundary([&] { KFSp_UpdateCacheToTime(insertion.stream, insertion.data, head.time); });
    insertion.ownsValue = code == 0;
    std::memcpy(static_cast<void*>(insertion.key), &head, static_cast<std::size_t>(KFSp_ValueDataOffset(&head)));
    return code;
}

int FillInValueAndTangents(Insertion& insertion, char mode)
{
    if (KFSp_ItemCount(insertion.data) == 0) return 0;
    if (!insertion.valueGiven) {
        if (!insertion.IsCustom())
            return KFSp_SubdivideSpline(insertion.stream, insertion.key->time, mode, insertion.key);
        if (int const code = EvaluateCustomValue(insertion)) return code;
    }
    return mode != 0 ? KFSp_SetDefaultKeyframeTangents(insertion.stream, insertion.key->time, mode, insertion.key) : 0;
}

int InsertNewKey(Insertion& insertion)
{
    KFSp_FirstError error;
    int const position = insertion.position;
    error.Keep(DecideInterps(insertion));
    if (error.None()) {
        // A split changes the keys on both sides before it is known whether the new key gets in.
        std::optional<KFSp_SavedKeys> around;
        if (!insertion.valueGiven && !insertion.IsCustom()) {
            KFSp_AnchorRange const range(insertion.data, position - 1, position);
            around.emplace(insertion.stream, insertion.data, range.first, range.last);
            error.Keep(around->Code());
        }
        bool const saved = error.None();
        if (error.None()) error.Keep(FillInValueAndTangents(insertion, TangentMode(insertion)));
        if (error.None()) error.Keep(KFSp_InsertKeyItem(insertion.data, insertion.key, position));
        if (!error.None() && around && saved) around->Restore();
    }
    error.Keep(insertion.stream->SetInvalid(position + 1, 2));
    error.Keep(insertion.stream->SetArcInvalid(position + 2, 4));
    return error.Code();
}

// The old key gives what the new one lacks. Its arc table stays with it: the record only carries it past the list's own
// copy.
int ReplaceOldKey(Insertion& insertion, KFSp_ScKey const& old)
{
    KFS_KeyScalar* const key = insertion.key;
    KFS_Stream* const stream = insertion.stream;
    if (key->inInterp == KFS_Interp_None) key->inInterp = old->inInterp;
    if (key->outInterp == KFS_Interp_None) key->outInterp = old->outInterp;
    char const mode = TangentMode(insertion);
    bool const hasTable = stream->IsSpatial() && KFSp_HasSpatialBlock(old.get()) && KFSp_HasSpatialBlock(key);
    SEQ_Head** const table = hasTable ? old->remapTable : nullptr;
    KFSp_FirstError error;
    if (stream->IsSpatial()) error.Keep(stream->SetArcInvalid(insertion.position + 2, 4));
    if (error.None() && !insertion.valueGiven) {
        error.Keep(CopyItem(insertion, KFS_Item_KeyValue, KFSp_ValueData(old.get()), KFSp_ValueData(key)));
        insertion.ownsValue = insertion.ownsValue || error.None();
    }
    if (error.None() && mode != 0) error.Keep(KFSp_SetDefaultKeyframeTangents(stream, key->time, mode, key));
    // Told here and not after the replacement, which then stays undone.
    if (error.None() && insertion.HasOpenSide())
        error.Keep(KFSp_ReportErr(KFSp_Op_InsertKeyFromCache, KFS_Err_InterpNotAllowed, KFS_Interp_None));
    if (error.None()) {
        error.Keep(KFSp_ReplaceKeyItem(insertion.data, key, insertion.position));
        if (error.None() && hasTable) old->remapTable = table;
    }
    return error.Code();
}

int OverwriteKey(Insertion& insertion)
{
    KFSp_FirstError error;
    if (insertion.overwrite) {
        KFSp_ScKey const old(insertion.data->keys, insertion.position, error);
        if (error.None()) error.Keep(ReplaceOldKey(insertion, old));
    } else {
        error.Keep(KFSp_ReportErr(KFSp_Op_InsertKeyFromCache, KFS_Err_KeyValue, KFSp_Row_OverwriteKey));
        // Nothing was pinned here, so this takes away a pin of the caller's if there is one. Callers count on that.
        error.Keep(SEQ_Unlock(insertion.data->keys));
    }
    error.Keep(insertion.stream->SetInvalid(insertion.position + 1, 2));
    return error.Code();
}

int InsertIntoList(Insertion& insertion)
{
    if (int const code = KFSp_CreateKeyList(insertion.stream)) return code;
    if (int const code = BringUpToDate(insertion)) return code;
    bool found = false;
    if (int const code = KFSp_SearchKeys(insertion.data, insertion.key->time, &found, &insertion.position)) return code;
    return found ? OverwriteKey(insertion) : InsertNewKey(insertion);
}

int InsertIntoKeyedStream(Insertion& insertion, bool clearCache)
{
    KFSp_FirstError error;
    error.Keep(KFSp_Boundary([&] { return InsertIntoList(insertion); }));
    if (clearCache || insertion.ownsValue) error.Keep(KFSp_ClearCache(insertion.stream));
    insertion.key->time = KFS_INVALID_INDEX;
    return error.Code();
}

// The record is the value itself, so it stays. With a value that is the caller's it becomes a copy of its own, in its
// place.
int TakeConstant(Insertion& insertion, bool ownsValue)
{
    insertion.position = 0;
    if (ownsValue) return 0;
    void* const value = KFSp_ValueData(insertion.key);
    int const code = CopyItem(insertion, KFS_Item_CacheWhole, value, value);
    if (code != 0) insertion.key->time = KFS_INVALID_INDEX;
    return code;
}

}  // namespace

int KFSp_PutKeyFromCache(KFS_Stream* stream, KFSp_PutKey const& how, int* index)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    Insertion insertion{stream, data, data->cache, how.overwrite, how.valueGiven, how.tangentsGiven, false};
    int const code = stream->HasNoKeys() ? TakeConstant(insertion, how.clearCache)
                                         : InsertIntoKeyedStream(insertion, how.clearCache);
    if (index) *index = code == 0 ? insertion.position : KFS_INVALID_INDEX;
    return code;
}

int KFSp_InsertKeyFromCache(unsigned char overwrite, unsigned char valueGiven, unsigned char tangentsGiven,
                            unsigned char clearCache, KFS_Stream* stream, int* index)
{
    KFSp_PutKey const how{overwrite != 0, valueGiven != 0, tangentsGiven != 0, clearCache != 0};
    if (int const code = KFSp_PutKeyFromCache(stream, how, index)) return code;
    return KFSp_Boundary([&] { stream->NotifyValueChanged(); });
}
