#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/byteorder.h"
#include "frame/services/chunkfile.h"
#include "frame/services/reports.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/stream.h"
#include "keystore/valuedata_private.h"
#include "overrides/streamexpression.h"
#include "persist/keyrecords_private.h"
#include "persist/leafchunks_private.h"
#include "persist/longs_private.h"
#include "persist/streamdisk_private.h"
#include "persist/versions_private.h"

#include <algorithm>
#include <string>
#include <typeinfo>
#include <vector>

namespace {

constexpr int ReadReportId = KFSp_ReportId(KFSp_Op_Read);

constexpr char const* WrongDimensionText = "$$$/VX/KFS/Read/InvalidDimensionOnDisk="
                                           "property of type \"@0\" had dimension @1 in file, but we expected @2";

void ReportWrongDimension(KFS_Stream const* stream, int found)
{
    u16str text = Q_ZStringToUTF16String(WrongDimensionText);
    // The name last, since nobody knows what stands in it.
    struct {
        char const* mark;
        u16str value;
    } const arguments[] = {{"@2", Q_MBToUTF16String(std::to_string(stream->GetDimension()))},
                           {"@1", Q_MBToUTF16String(std::to_string(found))},
                           {"@0", stream->GetMatchName16Str()}};
    for (auto const& argument : arguments)
        hearth::string::ReplaceInString(&text, Q_AsciiToUTF16String(argument.mark), argument.value);
    Q_ReportError(ReadReportId, Q_SeverityWarning, text);
}

// The next chunk must be the record. One that is too short has zeros behind it, and of one that is too long the front
// counts.
KFSp_StreamDiskData ReadRecord(CKF_File* file, CKF_ChunkInfo const* list)
{
    CKF_ScDescend const chunk(file, 0, 0, list, nullptr);
    int expected = 0;
    KFSp_ThrowIf(CKF_ConvertChunkIDToXMLFormat(KFSp_RecordId, &expected));
    CKF_ChunkInfo const* const info = chunk.GetChunkInfo();
    if (info->id != expected) throw KFSp_ReportErr(KFSp_Op_Read, KFS_Err_BadFileInfo, KFSp_Row_UnrecognizedChunk);
    KFSp_StreamDiskData record{};
    int size = static_cast<int>(std::min(info->size, static_cast<std::uint32_t>(sizeof record)));
    KFSp_ThrowIf(CKF_ReadChunkData(file, &size, &record));
    KFSp_StreamSwap(&record);
    return record;
}

KFS_ValueDesc DescriptionOf(KFSp_StreamDiskData const& record)
{
    KFS_ValueDesc desc;
    desc.isCustom = static_cast<short>(record.isCustom);
    desc.itemSize = record.itemSize;
    desc.dataType = record.isCustom ? 255 : record.dataType;
    return desc;
}

double ReadDouble(CKF_File* file, CKF_ChunkInfo const* list, int id)
{
    double number = 0.0;
    KFSp_ThrowIf(CKF_ReadAtom(file, id, list, sizeof number, &number));
    Q_FpLongSwap(&number);
    return number;
}

// Reads the content of one leaf's list behind what every node has.
class LeafReader {
public:
    LeafReader(KFS_Stream* stream, CKF_File* file, CKF_ChunkInfo const* list)
        : stream_(stream),
          file_(file),
          list_(list),
          isDerived_(typeid(*stream) != typeid(KFS_Stream)),
          wasConstant_(stream->HasNoKeys()),
          record_(ReadRecord(file, list))
    {}

    void ReadStream();
    void ReadParam();
    void Finish();

private:
    bool SuitsClientFuncs(KFS_ValueDesc const& desc) const;
    void CheckHeader() const;
    void TakeHeader();
    void TakeDescription();
    void KeepPointer();
    void ReadValue();
    void ReadConstant();
    void ReadKeys();
    void ReadExpression();
    void ReadLayer();
    void ReadSlider();
    void MarkAllStale();

    KFS_Stream* stream_;
    CKF_File* file_;
    CKF_ChunkInfo const* list_;
    bool isDerived_;
    bool wasConstant_;
    bool spatialMismatch_ = false;
    KFSp_StreamDiskData record_;
};

// A client's item functions know one shape of value only.
bool LeafReader::SuitsClientFuncs(KFS_ValueDesc const& desc) const
{
    KFS_CopyItemFunc const copy = stream_->GetCopyItemFunc();
    if (!stream_->GetDisposeItemFunc() && (!copy || copy == KFSp_FakeCopyItemFunc)) return true;
    return stream_->IsCustom() == (desc.isCustom != 0) &&
           (!desc.isCustom || desc.itemSize == stream_->GetValueDesc()->itemSize);
}

// Refuses what the stream can't become, before it is touched.
void LeafReader::CheckHeader() const
{
    if (isDerived_) {
        if (stream_->GetDimension() != record_.dimension) {
            ReportWrongDimension(stream_, record_.dimension);
            throw int{KFS_Err_BadFileInfo};
        }
        return;
    }
    bool const spatial = (record_.kfsFlags & KFS_StreamFlag_Spatial) != 0;
    KFS_ValueDesc const desc = DescriptionOf(record_);
    bool const knownType = desc.isCustom || static_cast<signed char>(record_.dataType) <= KFS_Type_Double;
    if (!knownType || !KFSp_KeyItemFits(desc, spatial, record_.dimension) || !SuitsClientFuncs(desc))
        throw int{KFS_Err_BadValueDesc};
}

void LeafReader::TakeHeader()
{
    unsigned short const flags = stream_->GetKFSFlags();
    spatialMismatch_ = isDerived_ && ((flags ^ record_.kfsFlags) & KFS_StreamFlag_Spatial) != 0;
    KFSp_DropKeyList(stream_);
    stream_->SetInterpMask(record_.interpMask);
    stream_->SetTimeScale(record_.timeScale);
    stream_->SetAccuracy(record_.accuracy.Get());
    stream_->SetSpInterp(record_.spInterp);
    if (!isDerived_)
        TakeDescription();
    else if (!spatialMismatch_)
        stream_->SetKFSFlags(record_.kfsFlags);
    for (int i = 0; i < 4; ++i) (*stream_->GetMultiplierForModify())[i] = record_.multiplier[i].Get();
    unsigned short const layout = stream_->IsSpatial() ? KFS_KeyFlag_SpatialBlock : 0;
    stream_->GetCache()->flags = static_cast<unsigned short>((record_.cacheFlags & ~KFS_KeyFlag_SpatialBlock) | layout);
}

// What decides about the size of records, and the cache record in that size.
void LeafReader::TakeDescription()
{
    KFSp_ThrowIf(KFSp_ClearCache(stream_));
    short const dimension = stream_->GetDimension();
    unsigned short const flags = stream_->GetKFSFlags();
    KFS_ValueDesc const desc = DescriptionOf(record_);
    KFS_ValueDesc old;
    stream_->SetDimension(record_.dimension);
    stream_->SetKFSFlags(record_.kfsFlags);
    int const code = KFSp_Boundary([&] {
        KFSp_ThrowIf(KFS_SetValueDescription(stream_, &desc, &old));
        stream_->SetSpInterpMask(record_.spInterpMask);
        stream_->AllocateCache();
    });
    if (code != 0) {
        stream_->SetDimension(dimension);
        stream_->SetKFSFlags(flags);
        static_cast<void>(KFS_SetValueDescription(stream_, &old, nullptr));
        throw int{code};
    }
}

void LeafReader::ReadValue()
{
    // Read aside, so that the old value is given back once the new one is there.
    int const size = KFSp_ValueDataSize(stream_);
    std::vector<unsigned char> value(static_cast<std::size_t>(size));
    KFSp_ThrowIf(CKF_ReadAtom(file_, KFSp_ValueId, list_, size, value.data()));
    KFSp_ThrowIf(KFSp_ClearCache(stream_));
    std::copy(value.begin(), value.end(), static_cast<unsigned char*>(KFSp_ValueData(stream_->GetCache())));
    KFSp_ThrowIf(KFSp_KeyScalarDataSwap(stream_, stream_->GetCache()));
    stream_->GetCache()->time = record_.cacheTime;
}

// The value isn't in the file. A constant keeps the one that it has, and a stream without one takes its default; what a
// keyed stream's cache record happens to hold is none. The record of a stream that has no default stays empty, since its
// bytes may once have been a pointer.
void LeafReader::KeepPointer()
{
    static_cast<void>(KFSp_ReadLong(file_, list_, KFSp_ValueId));
    bool const fileHasValue = record_.cacheTime != KFS_INVALID_INDEX;
    if (!wasConstant_ || !fileHasValue) KFSp_ThrowIf(KFSp_ClearCache(stream_));
    if (!fileHasValue) return;
    unsigned short const flags = stream_->GetCache()->flags;
    if (KFSp_CacheIsEmpty(stream_->GetCache())) stream_->InsertDefaultKey(T_Time{0, stream_->GetTimeScale()});
    stream_->GetCache()->flags = flags;
    if (!KFSp_CacheIsEmpty(stream_->GetCache())) stream_->GetCache()->time = record_.cacheTime;
}

void LeafReader::ReadConstant()
{
    if (stream_->IsCustomValuePointer() && !spatialMismatch_)
        KeepPointer();
    else if (!spatialMismatch_)
        ReadValue();
    KFS_KeyScalar* const cache = stream_->GetCache();
    cache->inInterp = record_.cacheInInterp;
    cache->outInterp = record_.cacheOutInterp;
    if (stream_->IsSpatial()) {
        cache->spFlags = record_.cacheSpFlags;
        cache->inSpeed = record_.cacheTangents[0].Get();
        cache->inInfluence = record_.cacheTangents[1].Get();
        cache->outSpeed = record_.cacheTangents[2].Get();
        cache->outInfluence = record_.cacheTangents[3].Get();
        cache->remapTable = nullptr;
    }
}

// The list's owner and functions are the stream's from the beginning, since the conversion made it.
void LeafReader::ReadKeys()
{
    KFSp_ScList disk;
    KFSp_ThrowIf(SEQ_Read(file_, &disk.list));
    KFSp_ConvertFromKeyDiskList(stream_, disk.list);
}

void LeafReader::ReadExpression()
{
    u16str text;
    if (CKF_Version_Gen7_PreUnicode(file_)) {
        char** handle = nullptr;
        KFSp_ThrowIf(CKF_ReadHandle(file_, list_, KFSp_OldExpressionId, &handle));
        text = CKF_ConvertHandleToStringAndDisposeIfEncoded(&handle, &file_->textEncoding);
    } else {
        CKF_ReadUTF16(file_, &text, list_);
    }
    static_cast<void>(KFS_SetStreamExpression(stream_, text));
    KFSp_ThrowIf(KFS_SetStreamExprFlags(stream_, 0xFFFFFFFFU, record_.exprFlags));
}

void LeafReader::ReadStream()
{
    CheckHeader();
    TakeHeader();
    if (stream_->HasNoKeys())
        ReadConstant();
    else
        KFSp_ThrowIf(KFSp_ClearCache(stream_));  // of the value of a constant that now has keys, maybe none
    if (record_.hasKeyList != 0 && !spatialMismatch_) ReadKeys();
    if (spatialMismatch_) {
        stream_->SetKFSFlags(stream_->GetKFSFlags() | KFS_StreamFlag_NoKeys);
        stream_->InsertDefaultKey(T_Time{0, stream_->GetTimeScale()});
    }
    if (record_.hasExpression != 0) ReadExpression();
}

void LeafReader::ReadLayer()
{
    FX_ParamDef::LayerValue& layer = stream_->GetParamDef().value.layer;
    layer.reservedPointer = Q_Int32ToPointer(KFSp_ReadLong(file_, list_, KFSp_LayerId));
    layer.layerSelector =
        KFSp_HasLayerSelector(file_) ? static_cast<short>(KFSp_ReadLong(file_, list_, KFSp_LayerSelectorId)) : short{0};
}

void LeafReader::ReadSlider()
{
    double low = ReadDouble(file_, list_, KFSp_SliderMinId);
    double high = ReadDouble(file_, list_, KFSp_SliderMaxId);
    if (low == 0.0 && high == 0.0) {  // no range was set
        low = stream_->GetMinValue();
        high = stream_->GetMaxValue();
    }
    stream_->SetUIMinValue(low);
    stream_->SetUIMaxValue(high);
}

void LeafReader::ReadParam()
{
    if (file_->majorVersion < KFSp_FirstVersion_ParamAtoms) return;
    int const kind = stream_->GetParamDef().paramType;
    if (kind == FX_Param_LAYER) {
        ReadLayer();
    } else if (KFSp_HasSliderRange(kind)) {
        ReadSlider();
    } else if (kind == FX_Param_PATH) {
        stream_->GetParamDef().value.path.pathIdentifier =
            static_cast<unsigned int>(KFSp_ReadLong(file_, list_, KFSp_PathId));
    }
}

// In the ranges themselves: a list may be longer than SetInvalid can say in its short count.
void LeafReader::MarkAllStale()
{
    int const count = stream_->GetKeyCount();
    for (int* const stale : {stream_->GetInvalidKeyIndexForModify(), stream_->GetArcInvalidKeyIndexForModify()}) {
        stale[0] = count > 0 ? 0 : KFS_INVALID_INDEX;
        stale[1] = count > 0 ? count - 1 : KFS_INVALID_INDEX;
    }
}

void LeafReader::Finish()
{
    MarkAllStale();
    if (stream_->GetParamDef().paramType != FX_Param_ALWAYS_SAVED) stream_->SetConstantIfNotAnimatable();
    KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_Read, stream_, KFSp_Row_Read));
}

void ReadLeaf(KFS_Stream* stream, CKF_File* file, CKF_ChunkInfo const* chunk)
{
    CKF_ScDescend descent;
    if (!chunk) {
        descent.Descend(file, CKF_ListId, KFSp_LeafListType, nullptr, nullptr);
        chunk = descent.GetChunkInfo();
    }
    // As they are before the file's flags come in.
    bool const readsParam = (stream->GetStreamBaseFlags() & KFS_BaseFlag_Reserved8) == 0;
    stream->KFS_StreamBase::Read(file, chunk);
    LeafReader reader(stream, file, chunk);
    reader.ReadStream();
    if (readsParam) reader.ReadParam();
    reader.Finish();
}

}  // namespace

void KFS_Stream::Read(CKF_File* file, CKF_ChunkInfo const* chunk)
{
    if ((GetStreamBaseFlags() & KFS_BaseFlag_SkipLeafRead) == 0)
        KFSp_ThrowIf(KFSp_Boundary([&] { ReadLeaf(this, file, chunk); }));
}

void KFS_Stream::SetConstantIfNotAnimatable()
{
    if (HasNoKeys() || CanBeAnimated()) return;
    ValidateCacheAtTime(T_Time{0, 1});
    KFSp_ThrowIf(SetConstant(1, 0));
}
