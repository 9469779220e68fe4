// Temporal handles as influences. Apart from graph tangents: the limits differ.
#include "curves/keyhandles_private.h"
#include "curves/segment_private.h"
#include "curves/tangents.h"
#include "keystore/curvehooks_private.h"
#include "keystore/items_private.h"
#include "keystore/pins_private.h"

#include <algorithm>

namespace {

void StoreInfluence(KFSp_Handles<double> const& handles, double const* given)
{
    for (int i = 0; i < handles.count; ++i) handles.influence[i] = std::clamp(given[i], 0.0, 1.0);
}

int SetInfluences(KFS_Stream* stream, int index, double const* in, double const* out)
{
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(stream->GetKeys(), index, error);
        if (error.None()) {
            if (in) StoreInfluence(KFSp_GetHandles(stream, key.get(), KFSp_Side::In), in);
            if (out) StoreInfluence(KFSp_GetHandles(stream, key.get(), KFSp_Side::Out), out);
            if (in && stream->IsSpatial()) error.Keep(stream->SetInvalid(index, 1));
            if (out && stream->IsSpatial()) error.Keep(stream->SetInvalid(index + 1, 1));
            key->flags &= static_cast<unsigned short>(~KFS_KeyFlag_Modifiable);
        }
    }
    return error.Code();
}

signed char InterpOf(KFS_KeyScalar const* key, KFSp_Side side)
{
    return side == KFSp_Side::In ? key->inInterp : key->outInterp;
}

int CopyInfluence(KFS_Stream const* stream, KFS_StreamKeyData const* data, KFS_KeyScalar* key, KFSp_Side side,
                  double* influence)
{
    bool const spline = InterpOf(key, side) == KFS_Interp_Spline;
    KFS_KeyScalar* const source = spline ? key : KFSp_BorrowCache(data, key);
    KFSp_Handles<double> const handles = KFSp_GetHandles(stream, source, side);
    if (!spline) std::fill_n(handles.influence, handles.count, KFSp_OneSixth);
    short const kind = key == data->cache ? KFS_Item_CacheValue : KFS_Item_KeyValue;
    return KFSp_FakeCopyItemFuncNoLimits(stream, stream->GetItemRefcon(), kind, handles.influence, influence);
}

int GetInfluence(KFS_Stream const* stream, KFS_StreamKeyData const* data, KFS_KeyScalar* key, KFSp_Side side,
                 double* influence)
{
    if (stream->IsSpatial()) {
        *influence =
            InterpOf(key, side) == KFS_Interp_Spline ? *KFSp_GetHandles(stream, key, side).influence : KFSp_OneSixth;
        return 0;
    }
    if (KFSp_HasHandleRuns(stream)) return CopyInfluence(stream, data, key, side, influence);
    std::fill_n(influence, stream->IsCustom() ? 1 : stream->GetDimension(), KFSp_OneSixth);
    return 0;
}

int RefuseCustom()
{
    // The text is the one that hosts know this refusal by, misspelling included.
    Q_ReportError(KFSp_ReportId(KFSp_Op_GetKeyInfluence), KFSp_Severity,
                  Q_AsciiToUTF16String("Attempting to get the key influence of a custon non-spatial stream."));
    return KFS_Err_CustomNotAllowed;
}

int SetKeyInfluence(KFS_Stream* stream, int index, double const* in, double const* out)
{
    if (int const code = KFSp_CheckHandleAccess(stream, {KFSp_Op_SetKeyInfluence, KFSp_Row_AlterKey},
                                                {KFSp_Op_SetKeyInfluence, KFSp_Row_InquireKey}))
        return code;
    KFSp_FirstError error;
    if (stream->HasKeys()) error.Keep(SetInfluences(stream, index, in, out));
    return KFSp_ForgetCachedValue(stream, error);
}

int GetKeyInfluence(KFS_Stream const* stream, int index, double* in, double* out)
{
    KFSp_Refusal const refusal{KFSp_Op_GetKeyInfluence, KFSp_Row_GetValue};
    if (int const code = KFSp_CheckHandleAccess(stream, refusal, refusal)) return code;
    stream = KFSp_Seen(stream);
    (void)stream->UpdateStreamIfStaleTangents(index);
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    KFS_KeyScalar* key = nullptr;
    if (int const code = KFSp_GetHandleKey(stream, data, index, &key)) return code;
    if (stream->IsCustom() && !stream->IsSpatial() && stream->GetValueDesc()->itemSize != sizeof(double))
        return RefuseCustom();
    if (in) {
        if (int const code = GetInfluence(stream, data, key, KFSp_Side::In, in)) return code;
    }
    return out ? GetInfluence(stream, data, key, KFSp_Side::Out, out) : 0;
}

}  // namespace

int KFSp_SetKeyInfluences(KFS_Stream* stream, int index, double const* in, double const* out)
{
    return KFSp_Boundary([&] { return SetKeyInfluence(stream, index, in, out); });
}

int KFS_SetKeyInfluence(KFS_Stream* stream, int index, double const* inInfluence, double const* outInfluence)
{
    return KFSp_TellOfHandleEdit(stream, KFSp_SetKeyInfluences(stream, index, inInfluence, outInfluence));
}

int KFS_GetKeyInfluence(KFS_Stream const* stream, int index, double* inInfluence, double* outInfluence)
{
    return KFSp_Boundary([&] { return GetKeyInfluence(stream, index, inInfluence, outInfluence); });
}
