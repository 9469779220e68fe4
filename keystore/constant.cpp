#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/reports.h"
#include "keystore/cache_private.h"
#include "keystore/edit_private.h"
#include "keystore/items.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"

namespace {

// Line numbers of the two verifications, by which reports of them are told apart.
constexpr int NotAnimatableLine = 997;
constexpr int CanonicalLine = 998;

void Verify(KFS_Stream const* stream)
{
    constexpr int id = KFSp_ReportId(KFSp_Op_SetConstant);
    if (!stream->CanBeAnimated()) {
        Q_ReportFailedVerification(id, NotAnimatableLine, 0, "attempt to animate a non-animatable stream");
    }
    if (stream->IsCanonical()) {
        Q_ReportFailedVerification(id, CanonicalLine, 0, "attempt to animate the canonical instance stream");
    }
}

int MakeKeyed(KFS_Stream* stream, bool keepValue)
{
    Verify(stream);
    stream->SetKFSFlags(stream->GetKFSFlags() & ~KFS_StreamFlag_NoKeys);
    if (!keepValue) {
        return KFSp_ClearCache(stream);
    }
    KFS_KeyScalar* const cache = stream->GetCache();
    if (KFSp_CacheIsEmpty(cache)) {
        return 0;
    }
    if (stream->IsSpatial()) {
        cache->flags &= ~KFS_KeyFlag_TangentsSet;
    }
    return KFSp_InsertKeyFromCache(0, 1, 0, 1, stream, nullptr);
}

int DisposeList(KFS_Stream* stream)
{
    int code = KFS_DisposeRemapTables(stream);
    if (KFS_KeyScalar* const cache = stream->GetCache(); KFSp_HasSpatialBlock(cache)) {
        cache->remapTable = nullptr;
    }
    if (code == 0) {
        SEQ_Head** const keys = stream->GetKeys();
        stream->SetKeys(nullptr);  // whatever the disposal says, the list is gone after it
        code = SEQ_Dispose(keys, 0);
    }
    return code;
}

int MakeConstant(KFS_Stream* stream)
{
    if (stream->GetKeys()) {
        if (int const code = DisposeList(stream)) {
            return code;
        }
    }
    stream->SetKFSFlags(stream->GetKFSFlags() | KFS_StreamFlag_NoKeys);
    for (int* const range : {stream->GetInvalidKeyIndexForModify(), stream->GetArcInvalidKeyIndexForModify()}) {
        range[0] = KFS_INVALID_INDEX;
        range[1] = KFS_INVALID_INDEX;
    }
    return 0;
}

}  // namespace

int KFS_Stream::SetConstant(unsigned char constant, unsigned char keepValue)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetConstant, this, KFSp_Row_SetConstant)) {
        return code;
    }
    bool const toConstant = constant != 0;
    if (HasNoKeys() == toConstant) {
        return 0;
    }
    KFSp_FirstError error;
    error.Keep(KFSp_Boundary([&] { return toConstant ? MakeConstant(this) : MakeKeyed(this, keepValue != 0); }));
    error.Keep(KFSp_Boundary([this] { NotifyValueChanged(); }));
    return error.Code();
}
