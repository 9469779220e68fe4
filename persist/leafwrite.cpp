#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/byteorder.h"
#include "frame/services/chunkfile.h"
#include "frame/services/reports.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/items.h"
#include "keystore/paramstreams.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"
#include "persist/keyrecords_private.h"
#include "persist/leafchunks_private.h"
#include "persist/longs_private.h"
#include "persist/streamdisk_private.h"
#include "persist/versions_private.h"

namespace {

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
    for (int i = 0; i < 4; ++i) record.multiplier[i].Set(multiplier[i]);
    KFS_ValueDesc const& desc = *stream->GetValueDesc();
    record.isCustom = static_cast<unsigned short>(desc.isCustom);
    record.itemSize = desc.itemSize;
    record.dataType = static_cast<unsigned char>(desc.isCustom ? 0xFF : desc.dataType & 0xFF);
    record.hasKeyList = stream->GetKeys() ? 1 : 0;
    record.exprFlags = stream->GetExpressionFlags();
    record.hasExpression = stream->HasExpression() ? 1 : 0;
    if (stream->HasNoKeys()) FillInCacheFields(stream, file, record);
    return record;
}

// The value data of the cache record in the file's byte order for a scope.
class ScSwappedValue {
public:
    explicit ScSwappedValue(KFS_Stream const* stream) : stream_(stream)
    {
        KFSp_ThrowIf(KFSp_KeyScalarDataSwap(stream_, stream_->GetCache()));
    }
    // What could be swapped can be swapped back.
    ~ScSwappedValue() { static_cast<void>(KFSp_KeyScalarDataSwap(stream_, stream_->GetCache())); }
    ScSwappedValue(ScSwappedValue const&) = delete;
    ScSwappedValue& operator=(ScSwappedValue const&) = delete;

private:
    KFS_Stream const* stream_;
};

void WriteConstant(KFS_Stream const* stream, CKF_File* file)
{
    if (stream->IsCustomValuePointer()) {
        KFSp_WriteLong(file, KFSp_ValueId, 0);  // an address means nothing to the next run
        return;
    }
    ScSwappedValue const swapped(stream);
    KFS_KeyScalar const* const cache = stream->GetCache();
    KFSp_ThrowIf(CKF_WriteAtom(file, KFSp_ValueId, KFSp_ValueDataSize(stream), KFSp_ValueData(cache)));
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
    int const code =
        handle ? CKF_WriteHandle(file, KFSp_OldExpressionId, handle) : static_cast<int>(KFS_Err_OutOfMemory);
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
    KFSp_WriteLong(file, KFSp_LayerId, Q_PointerToInt32(layer->GetFlattenedReserved0()));
    if (KFSp_HasLayerSelector(file))
        KFSp_WriteLong(file, KFSp_LayerSelectorId, stream->GetParamDef().value.layer.layerSelector);
}

void WriteParam(KFS_Stream const* stream, CKF_File* file)
{
    FX_ParamDef const& def = stream->GetParamDef();
    if (def.paramType == FX_Param_LAYER) {
        WriteLayer(stream, file);
    } else if (KFSp_HasSliderRange(def.paramType)) {
        WriteDouble(file, KFSp_SliderMinId, stream->GetUIMinValue());
        WriteDouble(file, KFSp_SliderMaxId, stream->GetUIMaxValue());
    } else if (def.paramType == FX_Param_PATH) {
        KFSp_WriteLong(file, KFSp_PathId, static_cast<int>(def.value.path.pathIdentifier));
    }
}

void WriteLeaf(KFS_Stream const* stream, CKF_File* file)
{
    KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_Write, stream, KFSp_Row_Write));
    if (stream->HasKeys()) KFSp_ThrowIf(KFSp_ClearCache(stream));
    KFSp_StreamDiskData record = MakeRecord(stream, file);
    bool const hasKeyList = record.hasKeyList != 0;
    bool const hasExpression = record.hasExpression != 0;
    KFSp_StreamSwap(&record);

    CKF_ChunkInfo chunk{};
    KFSp_ThrowIf(CKF_BeginChunkWrite(file, CKF_ListId, KFSp_ValueDataSize(stream) + 140, KFSp_LeafListType, &chunk));
    stream->KFS_StreamBase::Write(file);
    KFSp_ThrowIf(CKF_WriteAtom(file, KFSp_RecordId, sizeof record, &record));
    if (stream->HasNoKeys()) WriteConstant(stream, file);
    if (hasKeyList) WriteKeys(stream, file);
    if (hasExpression) WriteExpression(stream, file);
    WriteParam(stream, file);
    KFSp_ThrowIf(CKF_EndChunkWrite(file, &chunk));
}

}  // namespace

bool KFS_Stream::ShouldWriteForVersion(CKF_File const* file) const
{
    if (file->majorVersion < KFSp_FirstVersion_NewParamKinds) {
        int const kind = GetParamDef().paramType;
        if (kind == FX_Param_LABEL || kind == FX_Param_POINT_3D) return false;
    }
    return KFS_StreamBase::ShouldWriteForVersion(file);
}

void KFS_Stream::Write(CKF_File* file) const
{
    KFSp_ThrowIf(KFSp_Boundary([&] { WriteLeaf(this, file); }));
}
