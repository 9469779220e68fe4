// The move between one value and keys.

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/reports.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/edit_private.h"
#include "keystore/items.h"
#include "keystore/savedrecords_private.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"

namespace {

// Line numbers of the two verifications, by which reports of them are told apart.
constexpr int NotAnimatableLine = 997;
constexpr int CanonicalLine = 998;

void Verify(KFS_Stream const* stream)
{
    constexpr int id = KFSp_ReportId(KFSp_Op_SetConstant);
    if (!stream->CanBeAnimated())
        Q_ReportFailedVerification(id, NotAnimatableLine, 0, "attempt to animate a non-animatable stream");
    if (stream->IsCanonical())
        Q_ReportFailedVerification(id, CanonicalLine, 0, "attempt to animate the canonical instance stream");
}

void SetNoKeys(KFS_Stream* stream, bool on)
{
    unsigned short& flags = *stream->GetKFSFlagsForModify();
    flags = static_cast<unsigned short>(on ? flags | KFS_StreamFlag_NoKeys : flags & ~KFS_StreamFlag_NoKeys);
    stream->ShowChangeInCopy();
}

int DisposeList(KFS_Stream* stream)
{
    int code = KFS_DisposeRemapTables(stream);
    if (KFS_KeyScalar* const cache = stream->GetCache(); KFSp_HasSpatialBlock(cache)) cache->remapTable = nullptr;
    if (code == 0) {
        SEQ_Head** const keys = stream->GetKeys();
        stream->SetKeys(nullptr);  // whatever the disposal says, the list is gone after it
        code = SEQ_Dispose(keys, 0);
    }
    return code;
}

// The list gets a copy, and the value is given back once the copy is in. Until then it can return.
int MakeFirstKey(KFS_Stream* stream)
{
    bool const hadList = stream->GetKeys() != nullptr;
    KFSp_SavedCache const value(stream);
    KFSp_FirstError error;
    error.Keep(value.Code());
    if (error.None()) {
        KFS_KeyScalar* const cache = stream->GetCache();
        if (stream->IsSpatial()) cache->flags &= ~KFS_KeyFlag_TangentsSet;
        error.Keep(KFSp_PutKeyFromCache(stream, {.valueGiven = true}, nullptr));
        if (!error.None()) value.Restore();
    }
    if (!error.None()) {
        if (!hadList && stream->GetKeys()) static_cast<void>(DisposeList(stream));
        SetNoKeys(stream, true);
        return error.Code();
    }
    error.Keep(KFSp_ClearCacheRecord(stream, value.get()));
    error.Keep(KFSp_Boundary([stream] { stream->NotifyValueChanged(); }));
    return error.Code();
}

int MakeKeyed(KFS_Stream* stream, bool keepValue)
{
    Verify(stream);
    SetNoKeys(stream, false);
    if (!keepValue) return KFSp_ClearCache(stream);
    return KFSp_CacheIsEmpty(stream->GetCache()) ? 0 : MakeFirstKey(stream);
}

int MakeConstant(KFS_Stream* stream)
{
    if (stream->GetKeys()) {
        if (int const code = DisposeList(stream)) return code;
    }
    SetNoKeys(stream, true);
    for (int* const range : {stream->GetInvalidKeyIndexForModify(), stream->GetArcInvalidKeyIndexForModify()}) {
        range[0] = KFS_INVALID_INDEX;
        range[1] = KFS_INVALID_INDEX;
    }
    return 0;
}

}  // namespace

int KFS_Stream::SetConstant(unsigned char constant, unsigned char keepValue)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetConstant, this, KFSp_Row_SetConstant)) return code;
    bool const toConstant = constant != 0;
    if (HasNoKeys() == toConstant) return 0;
    KFSp_FirstError error;
    error.Keep(KFSp_Boundary([&] { return toConstant ? MakeConstant(this) : MakeKeyed(this, keepValue != 0); }));
    error.Keep(KFSp_Boundary([this] { NotifyValueChanged(); }));
    return error.Code();
}
