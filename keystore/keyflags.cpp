// Changes of the flag word of a key.

#include "keystore/keyflags.h"

#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/curvehooks_private.h"
#include "keystore/edit_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/savedrecords_private.h"
#include "keystore/valuedata_private.h"

namespace {

// A change of these is felt by the neighbours' derived data.
constexpr unsigned short ShapingFlags = KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable | KFS_KeyFlag_Float;

struct FlagChange {
    unsigned short mask;
    unsigned short value;

    bool Differs(unsigned short flags) const { return ((flags ^ value) & mask) != 0; }
    unsigned short Apply(unsigned short flags) const
    {
        return static_cast<unsigned short>((flags & ~mask) | (value & mask));
    }
    bool Sets(unsigned short bit) const { return (mask & value & bit) != 0; }
};

bool ChangesFloat(KFS_Stream const* stream, unsigned short flags, FlagChange const& change)
{
    return stream->IsSpatial() && ((flags ^ change.value) & change.mask & KFS_KeyFlag_Float) != 0;
}

// Before the word is written: a key that becomes an anchor gets handles of its own, and the end keys stay anchors.
int ChangeFloat(KFS_Stream* stream, KFS_StreamKeyData const* data, KFS_KeyScalar* key, int index, FlagChange* change)
{
    KFSp_FirstError error;
    if (KFSp_Floats(key))
        error.Keep(KFSp_SubdivideSpline(stream, key->time, KFSp_Tangents_Temporal, key));
    else if (index == 0 || index == KFSp_ItemCount(data) - 1)
        change->value &= static_cast<unsigned short>(~KFS_KeyFlag_Float);
    error.Keep(stream->SetInvalid(index + 1, 2));
    error.Keep(stream->SetArcInvalid(index + 1, 2));
    return error.Code();
}

int ChangeFlags(KFS_Stream* stream, KFS_StreamKeyData const* data, KFS_KeyScalar* key, int index, FlagChange change)
{
    KFSp_FirstError error;
    if ((change.mask & ShapingFlags) != 0) {
        if (ChangesFloat(stream, key->flags, change))
            error.Keep(ChangeFloat(stream, data, key, index, &change));
        else if (change.Differs(key->flags))
            error.Keep(stream->SetInvalid(index + 1, 2));
    }
    if (error.None()) {
        key->flags = change.Apply(key->flags);
        // A custom value has no handles, but for those along a path.
        bool const hasHandles = stream->IsSpatial() || !stream->IsCustom();
        if (change.Sets(KFS_KeyFlag_Continuous) && index != 0 && hasHandles)
            error.Keep(KFSp_EqualizeSides(stream, index));
    }
    return error.Code();
}

int ChangeKey(KFS_Stream* stream, KFS_StreamKeyData const* data, int index, FlagChange const& change)
{
    KFS_KeyScalar const* present = nullptr;
    if (int const code = KFSp_GetConstKey(data, index, &present)) return code;
    if (KFSp_Floats(present) && ChangesFloat(stream, present->flags, change)) {
        // Its time is about to become its own, so it has to be the right one.
        if (int const code = stream->UpdateStream()) return code;
    }
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(data->keys, index, error);
        if (error.None()) {
            KFSp_AnchorRange const range(data, index - 1, index + 1);
            KFSp_SavedKeys const around(stream, data, range.first, range.last);
            error.Keep(around.Code());
            if (error.None()) {
                error.Keep(ChangeFlags(stream, data, key.get(), index, change));
                if (!error.None()) around.Restore();
            }
        }
    }
    return error.Code();
}

int SetKeyFlags(KFS_Stream* stream, int index, FlagChange const& change)
{
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_KeyFlags, KFS_Err_NoKeys, KFSp_Row_InquireKey);
    if (stream->HasNoKeys()) {
        data->cache->flags = change.Apply(data->cache->flags);
        return 0;
    }
    KFSp_FirstError error;
    error.Keep(KFSp_ClearCache(stream));
    if (error.None()) error.Keep(ChangeKey(stream, data, index, change));
    // The work above leaves the record empty (C1), but a listener who heard of it may have read.
    error.Keep(KFSp_ClearCache(stream));
    return error.Code();
}

}  // namespace

int KFS_SetKeyFlags(KFS_Stream* stream, int index, unsigned short mask, unsigned short value)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetKeyFlags, stream, KFSp_Row_AlterKey)) return code;
    FlagChange const change{static_cast<unsigned short>(mask & ~KFS_KeyFlag_SpatialBlock), value};
    int const code = KFSp_Boundary([&] { return SetKeyFlags(stream, index, change); });
    return code != 0 ? code : KFSp_Boundary([&] { stream->NotifyValueChanged(); });
}

int KFS_SetKeyContinuous(KFS_Stream* stream, unsigned char on, int index)
{
    return KFS_SetKeyFlags(stream, index, KFS_KeyFlag_Continuous, on ? KFS_KeyFlag_Continuous : 0);
}

int KFS_SetKeyModifiable(KFS_Stream* stream, unsigned char on, int index)
{
    return KFS_SetKeyFlags(stream, index, KFS_KeyFlag_Modifiable, on ? KFS_KeyFlag_Modifiable : 0);
}

int KFSp_SetKeySpatialState(SEQ_Head**, long on, int, void* key)
{
    auto* const record = static_cast<KFS_KeyScalar*>(key);
    record->flags = static_cast<unsigned short>(on ? record->flags | KFS_KeyFlag_SpatialBlock
                                                   : record->flags & ~KFS_KeyFlag_SpatialBlock);
    return 0;
}

int KFSp_KeyClearRemap(SEQ_Head**, long, int, void* key)
{
    auto* const record = static_cast<KFS_KeyScalar*>(key);
    if (KFSp_HasSpatialBlock(record)) record->remapTable = nullptr;
    return 0;
}
