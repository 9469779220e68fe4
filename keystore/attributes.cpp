// Operations on a stream as a whole that change no key.

#include "keystore/attributes.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/attributes_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"

#include <cmath>

namespace {

void MarkAllKeys(KFS_Stream const* stream)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    int const count = stream->HasNoKeys() ? 0 : KFSp_ItemCount(data);
    KFSp_MarkAllKeys(data->invalidKeyIndex, count);
    KFSp_MarkAllKeys(data->arcInvalidKeyIndex, count);
}

// A value that was computed with what has just been changed isn't to be answered again. A constant's value stays.
int ForgetComputedValue(KFS_Stream const* stream)
{
    return stream->HasKeys() ? KFSp_ClearCache(stream) : 0;
}

int Notify(KFS_Stream* stream)
{
    return KFSp_Boundary([stream] { stream->NotifyValueChanged(); });
}

int RefuseMultiplier()
{
    return KFSp_ReportErr(KFSp_Op_SetMultiplier, KFS_Err_NotSpatial, KFSp_Row_SetMultiplier);
}

}  // namespace

int KFSp_CanDoSpInterp(KFS_Stream* stream, unsigned short code)
{
    unsigned int const mask = stream->GetInterpMask();
    if (code == 0 || (code <= 16 && ((mask >> (code - 1)) & 1U) != 0)) return 0;
    return KFSp_ReportNumber(KFSp_Op_CanDoSpInterp, KFS_Err_InterpNotAllowed, KFSp_Row_SpInterpNotAllowed, code);
}

int KFS_MergeStream(KFS_Stream* stream, T_Time const*, KFS_Stream** other)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_Merge, stream, KFSp_Row_Merge)) return code;
    return KFSp_CheckStream(KFSp_Op_Merge, *other, KFSp_Row_Merge);
}

int KFS_SetStreamIMask(KFS_Stream* stream, unsigned short mask)
{
    int const code = KFSp_CheckStream(KFSp_Op_SetIMask, stream, KFSp_Row_SetIMask);
    if (code == 0) stream->SetInterpMask(mask);
    return code;
}

int KFS_SetStreamSpIMask(KFS_Stream* stream, unsigned short mask)
{
    int const code = KFSp_CheckStream(KFSp_Op_SetSpIMask, stream, KFSp_Row_SetSpIMask);
    if (code == 0) stream->SetSpInterpMask(mask);
    return code;
}

int KFS_SetStreamSpInterp(KFS_Stream* stream, unsigned short spInterp)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_SetSpInterp, stream, KFSp_Row_SetSpInterp)) return code;
        if (int const code = KFSp_CanDoSpInterp(stream, spInterp)) return code;
        bool const changes = stream->GetSpInterp() != spInterp;
        stream->SetSpInterp(spInterp);
        return changes ? ForgetComputedValue(stream) : 0;
    });
}

int KFS_SetStreamSParametrize(KFS_Stream* stream, unsigned char on)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_SetSParametrize, stream, KFSp_Row_SetSpInterp)) return code;
        if (!stream->IsSpatial())
            return KFSp_ReportRow(KFSp_Op_SetSParametrize, KFS_Err_NotSpatial, KFSp_Row_StreamIsntSpatial);
        KFSp_FirstError error;
        if (stream->IsSParametrized() != (on != 0)) {
            MarkAllKeys(stream);
            error.Keep(ForgetComputedValue(stream));
            stream->SetKFSFlags(stream->GetKFSFlags() ^ KFS_StreamFlag_SParametrize);
            stream->ShowChangeInCopy();
        }
        return error.None() ? Notify(stream) : error.Code();
    });
}

int KFS_SetCustomFuncs(KFS_Stream* stream, KFS_CopyItemFunc copyItem, KFS_DisposeItemFunc disposeItem)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_SetCustomFuncs, stream, KFSp_Row_SetCustomFuncs)) return code;
        stream->SetCopyItemFunc(copyItem);
        stream->SetDisposeItemFunc(disposeItem);
        stream->ShowChangeInCopy();
        return KFSp_SetKeyFuncs(stream);
    });
}

int KFS_GetStreamAccuracy(KFS_Stream const* stream, double* accuracy)
{
    int const code = KFSp_CheckStream(KFSp_Op_GetAccuracy, stream, KFSp_Row_SetValueDesc);
    if (code == 0) *accuracy = std::sqrt(stream->GetAccuracy());
    return code;
}

int KFS_SetStreamAccuracy(KFS_Stream* stream, double const* newValue, double* oldValue)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetAccuracy, stream, KFSp_Row_SetValueDesc)) return code;
    if (oldValue) *oldValue = std::sqrt(stream->GetAccuracy());
    if (newValue) stream->SetAccuracy(*newValue * *newValue);
    return 0;
}

int KFS_GetStreamMultiplier(KFS_Stream const* stream, double* multiplier)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetMultiplier, stream, KFSp_Row_SetValueDesc)) return code;
    if (!stream->IsSpatial()) return RefuseMultiplier();
    for (int i = 0; i < stream->GetDimension(); ++i) multiplier[i] = stream->GetMultiplier()[i & 3];
    return 0;
}

int KFS_SetStreamMultiplier(KFS_Stream* stream, double const* newValue, double* oldValue)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_SetMultiplier, stream, KFSp_Row_SetValueDesc)) return code;
        if (!stream->IsSpatial()) return RefuseMultiplier();
        M_Vector4T<double>& multiplier = *stream->GetMultiplierForModify();
        for (int i = 0; i < stream->GetDimension(); ++i) {
            if (oldValue) oldValue[i] = multiplier[i & 3];
            if (newValue) multiplier[i & 3] = newValue[i];
        }
        if (!newValue) return 0;
        stream->ShowChangeInCopy();
        MarkAllKeys(stream);
        if (int const code = ForgetComputedValue(stream)) return code;
        return Notify(stream);
    });
}
