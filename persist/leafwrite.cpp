#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/byteorder.h"
#include "frame/services/chunkfile.h"
#include "frame/services/reports.h"
#include "keystore/cache_private.h"
#include "keystore/items.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"
#include "persist/keyrecords_private.h"
#include "persist/longs_private.h"
#include "persist/streamdisk_private.h"
#include "persist/versions_private.h"
#include "tree/paramstreams.h"

// A leaf in a file:
//
//   LIST kfbs
//     kfsb, kfsn         what every node has
//     kfb4               the record
//     cdat               the value, of a stream without keys
//     seql               the keys, if there is a key list: a constant may own one too
//     expr or Utf8       the expression's text, if there is one
//     kfpi kfps, kfum kfuM, or kfli   of some kinds of parameter

namespace {

int ValueSize(KFS_Stream const* stream)
{
    return KFS_GetKeyScalarDataSize(stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension());
}

void FillInCacheFields(KFS_Stream const* stream, CKF_File const* file, KFSp_StreamDiskData& record)
{
    KFS_KeyScalar const* const cache = stream->GetCache();
    // The time of the last read isn't an edit, so two saves of one project are to be the same without it.
    record.cacheTime = file->GetShouldWriteModificationTimes() ? cache->time : 0;
    record.cacheInInterp = cache->inInterp;
    record.cacheOutInterp = cache->outInterp;
    record.cacheFlags = cache->flags;
    if (stream->IsSpatial()) {
        record.cacheSpFlags = cache->spFlags;
        record.cacheTangents[0].Set(cache->inSpeed);
        record.cacheTangents[1].Set(cache->inInfluence);
        record.cacheTangents[2].Set(cache->outSpeed);
        record.cacheTangents[3].Set(cache->outInfluence);
    }
}

KFSp_StreamDiskData MakeRecord(KFS_Stream const* stream, CKF_File const* file)
{
    KFSp_StreamDiskData record{};
    record.stamp = stream->GetStamp();
    record.dimension = stream->GetDimension();
    record.kfsFlags = stream->GetKFSFlags();
    record.spInterp = stream->GetSpInterp();
    record.spInterpMask = stream->GetSpInterpMask();
    record.interpMask = stream->GetInterpMask();
    record.timeScale = stream->GetTimeScale();
    record.accuracy.Set(stream->GetAccuracy());
    M_Vector4T<double> const& multiplier = stream->GetMultiplier();
    for (int i = 0; i < 4; ++i) {
        record.multiplier[i].Set(multiplier[i]);
    }
    KFS_ValueDesc const& desc = *stream->GetValueDesc();
    record.isCustom = static_cast<unsigned short>(desc.isCustom);
    record.itemSize = desc.itemSize;
    record.dataType = static_cast<unsigned char>(desc.isCustom ? 0xFF : desc.dataType & 0xFF);
    record.hasKeyList = stream->GetKeys() ? 1 : 0;
    record.exprFlags = stream->GetExpressionFlags();
    record.hasExpression = stream->HasExpression() ? 1 : 0;
    if (stream->HasNoKeys()) {
        FillInCacheFields(stream, file, record);
    }
    return record;
}

// The value data of the cache record in the file's byte order for a scope.
class ScSwappedValue {
public:
    explicit ScSwappedValue(KFS_Stream const* stream) : stream_(stream)
    {
        KFSp_KeyScalarDataSwap(stream_, stream_->GetCache());
    }
    ~ScSwappedValue() { KFSp_KeyScalarDataSwap(stream_, stream_->GetCache()); }
    ScSwappedValue(ScSwappedValue const&) = delete;
    ScSwappedValue& operator=(ScSwappedValue const&) = delete;

private:
    KFS_Stream const* stream_;
};

void WriteConstant(KFS_Stream const* stream, CKF_File* file)
{
    constexpr int id = CKF_Id("cdat");
    if (stream->IsCustomValuePointer()) {
        KFSp_WriteLong(file, id, 0);  // an address means nothing to the next run
        return;
    }
    ScSwappedValue const swapped(stream);
    KFS_KeyScalar const* const cache = stream->GetCache();
    KFSp_ThrowIf(CKF_WriteAtom(file, id, ValueSize(stream), KFSp_ValueData(cache)));
}

void WriteKeys(KFS_Stream const* stream, CKF_File* file)
{
    KFSp_ScList disk;
    KFSp_ThrowIf(KFSp_CreateKeyDiskList(const_cast<KFS_Stream*>(stream), disk.list));
    KFSp_ConvertToKeyDiskList(stream, disk.list);
    KFSp_ThrowIf(SEQ_Write(disk.list, file));
}

void WriteExpression(KFS_Stream const* stream, CKF_File* file)
{
    u16str const& text = stream->GetExprInfo().GetExpression();
    if (!CKF_Version_Gen7_PreUnicode(file)) {
        CKF_WriteUTF16(file, text);
        return;
    }
    char** const handle = CKF_NewHandleFromString(text, true);
    int const code = handle ? CKF_WriteHandle(file, CKF_Id("expr"), handle) : static_cast<int>(KFS_Err_OutOfMemory);
    Q_FreeHandle(handle);
    KFSp_ThrowIf(code);
}

void WriteDouble(CKF_File* file, int id, double number)
{
    Q_FpLongSwap(&number);
    KFSp_ThrowIf(CKF_WriteAtom(file, id, sizeof number, &number));
}

void WriteLayer(KFS_Stream const* stream, CKF_File* file)
{
    auto const* const layer = dynamic_cast<KFS_ParamLayerStream const*>(stream);
    if (!layer) {
        Qp_ReportErrString(KFSp_ReportId(KFSp_Op_Write), KFSp_Severity,
                           "stream with FX_Param_LAYER isn't a KFS_ParamLayerStream");
        throw int{KFS_Err_LegacyMismatch};
    }
    KFSp_WriteLong(file, CKF_Id("kfpi"), Q_PointerToInt32(layer->GetFlattenedReserved0()));
    if (KFSp_HasLayerSelector(file)) {
        KFSp_WriteLong(file, CKF_Id("kfps"), stream->GetParamDef().value.layer.layerSelector);
    }
}

void WriteParam(KFS_Stream const* stream, CKF_File* file)
{
    switch (stream->GetParamDef().paramType) {
    case FX_Param_LAYER: WriteLayer(stream, file); break;
    case FX_Param_INT_SLIDER:
    case FX_Param_FIXED_SLIDER:
    case FX_Param_FLOAT_SLIDER:
        WriteDouble(file, CKF_Id("kfum"), stream->GetUIMinValue());
        WriteDouble(file, CKF_Id("kfuM"), stream->GetUIMaxValue());
        break;
    case FX_Param_PATH:
        KFSp_WriteLong(file, CKF_Id("kfli"), static_cast<int>(stream->GetParamDef().value.path.pathIdentifier));
        break;
    default: break;
    }
}

}  // namespace

bool KFS_Stream::ShouldWriteForVersion(CKF_File const* file) const
{
    if (file->majorVersion < KFSp_FirstVersion_NewParamKinds) {
        int const kind = GetParamDef().paramType;
        if (kind == FX_Param_LABEL || kind == FX_Param_POINT_3D) {
            return false;
        }
    }
    return KFS_StreamBase::ShouldWriteForVersion(file);
}

void KFS_Stream::Write(CKF_File* file) const
{
    KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_Write, this, KFSp_Row_Write));
    if (HasKeys()) {
        KFSp_ThrowIf(KFSp_ClearCache(this));
    }
    KFSp_StreamDiskData record = MakeRecord(this, file);
    bool const hasKeyList = record.hasKeyList != 0;
    bool const hasExpression = record.hasExpression != 0;
    KFSp_StreamSwap(&record);

    CKF_ChunkInfo chunk{};
    KFSp_ThrowIf(CKF_BeginChunkWrite(file, CKF_ListId, ValueSize(this) + 140, CKF_Id("kfbs"), &chunk));
    KFS_StreamBase::Write(file);
    KFSp_ThrowIf(CKF_WriteAtom(file, CKF_Id("kfb4"), sizeof record, &record));
    if (HasNoKeys()) {
        WriteConstant(this, file);
    }
    if (hasKeyList) {
        WriteKeys(this, file);
    }
    if (hasExpression) {
        WriteExpression(this, file);
    }
    WriteParam(this, file);
    KFSp_ThrowIf(CKF_EndChunkWrite(file, &chunk));
}
