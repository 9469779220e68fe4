// A leaf's life: made, copied, seen by renders, unmade. Its other operations stand by what they are about.

#include "keystore/stream.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/services/context.h"
#include "keystore/attributes.h"
#include "keystore/attributes_private.h"
#include "keystore/cache_private.h"
#include "keystore/cachestate.h"
#include "keystore/check_private.h"
#include "keystore/curvehooks_private.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/shortcuts_private.h"
#include "keystore/valuedata_private.h"
#include "tree/listener_private.h"

#include <array>
#include <utility>

namespace {

// The arc table of a key; null where there is none.
SEQ_Head** RemapTableOf(KFS_KeyScalar const* key)
{
    return KFSp_HasSpatialBlock(key) ? key->remapTable : nullptr;
}

// Gives the duplicate of a list arc tables of its own. All keys are visited, also after a failure: until a key has
// been, its table may be the source's.
int DuplicateRemapTables(SEQ_Head const* const* source, SEQ_Head** copy)
{
    KFSp_FirstError error;
    for (int i = 0; i < (*copy)->count; ++i) {
        void const* from = nullptr;
        void* to = nullptr;
        error.Keep(SEQ_GetConstAddress(source, i, &from));
        error.Keep(SEQ_GetAddress(copy, i, 0, &to));
        if (!from || !to) return error.Code();
        auto* const key = static_cast<KFS_KeyScalar*>(to);
        SEQ_Head** const table = RemapTableOf(static_cast<KFS_KeyScalar const*>(from));
        if (KFSp_HasSpatialBlock(key)) key->remapTable = nullptr;
        if (table && error.None()) error.Keep(SEQ_Duplicate(table, 0, &key->remapTable));
    }
    return error.Code();
}

// By KFS_Type.
constexpr std::array<unsigned short, 10> ElementSizes{1, 1, 2, 2, 4, 4, 4, 4, 4, 8};

// The stream, before anything else of it is read. Throws 2.
KFS_Stream const& Undamaged(KFS_Stream const& source)
{
    KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_StreamCopy, &source, KFSp_Row_Duplicate));
    return source;
}

int SetCustomDescription(KFS_Stream* stream, KFS_ValueDesc const& desc)
{
    if (!KFSp_KeyItemFits(desc, stream->IsSpatial(), stream->GetDimension())) return KFS_Err_BadValueDesc;
    *stream->GetValueDescForModify() = desc;
    stream->SetInterpFunc(desc.interpFunc);
    if (stream->GetCopyItemFunc()) return 0;
    if (int const code = KFSp_CheckStream(KFSp_Op_SetCustomFuncs, stream, KFSp_Row_SetCustomFuncs)) return code;
    stream->SetCopyItemFunc(KFSp_FakeCopyItemFunc);
    stream->SetDisposeItemFunc(nullptr);
    return KFSp_SetKeyFuncs(stream);
}

int SetPlainDescription(KFS_Stream* stream, KFS_ValueDesc const& newDesc)
{
    auto const type = static_cast<signed char>(newDesc.dataType & 0xFF);
    if (type > KFS_Type_Double ||
        !KFSp_KeyItemFits(*stream->GetValueDesc(), stream->IsSpatial(), stream->GetDimension()))
        return KFS_Err_BadValueDesc;
    KFS_ValueDesc* const desc = stream->GetValueDescForModify();
    desc->dataType = (desc->dataType & ~0xFFL) | (newDesc.dataType & 0xFF);
    int code = 0;
    if (type >= 0) {
        desc->itemSize = ElementSizes[static_cast<unsigned char>(type)];
    } else {
        code = KFSp_CheckStream(KFSp_Op_SetCustomFuncs, stream, KFSp_Row_SetCustomFuncs);
        if (code == 0) {
            stream->SetCopyItemFunc(nullptr);
            stream->SetDisposeItemFunc(nullptr);
            code = KFSp_SetKeyFuncs(stream);
        }
    }
    stream->SetInterpFunc(stream->IsSpatial() ? KFSp_InterpolateSpatial : KFSp_Interpolate);
    return code;
}

}  // namespace

KFS_StreamKeyData::KFS_StreamKeyData(KFS_StreamKeyData const& source, KFS_Stream const* owner)
    : stream(owner),
      invalidKeyIndex{source.invalidKeyIndex[0], source.invalidKeyIndex[1]},
      arcInvalidKeyIndex{source.arcInvalidKeyIndex[0], source.arcInvalidKeyIndex[1]}
{
    if (source.keys) KFSp_ThrowIf(SEQ_Duplicate(source.keys, 0, &keys));
    KFSp_FirstError error;
    if (keys) {
        error.Keep(SEQ_SetRefcon((*source.keys)->refcon, keys));
        if (owner->IsSpatial()) error.Keep(DuplicateRemapTables(source.keys, keys));
    }
    try {
        KFSp_ThrowIf(error.Code());
        cache = owner->CloneCache(source.cache);
    } catch (...) {
        KFSp_DisposeKeyList(keys);
        throw;
    }
    valueOwner_ = owner->GetDisposeItemFunc() ? owner : nullptr;
}

KFS_StreamKeyData::~KFS_StreamKeyData()
{
    if (valueOwner_) static_cast<void>(KFSp_ClearCacheRecord(valueOwner_, cache));
    KFSp_DisposeKeyList(keys);
    Q_FreePtr(cache);
}

KFS_Stream::KFS_Stream(short dimension, unsigned int timeScale, unsigned char noKeys, unsigned char spatial,
                       unsigned short interpMask, unsigned short spInterpMask, KFS_ValueDesc const& valueDesc,
                       KFS_MatchName const* matchName, KFS_StreamFactory* factory, bool canonical)
    : KFS_StreamBase(matchName, factory, canonical),
      multiplier_{1.0, 1.0, 1.0, 1.0},
      spInterpMask_(spInterpMask),
      interpMask_(interpMask),
      stamp_(KFS_StreamValidStamp),
      dimension_(dimension),
      timeScale_(timeScale),
      interpFunc_(KFSp_Interpolate)
{
    if (noKeys) kfsFlags_ |= KFS_StreamFlag_NoKeys;
    if (spatial) {
        kfsFlags_ |= KFS_StreamFlag_Spatial | KFS_StreamFlag_NonDecreasing;
        interpFunc_ = KFSp_InterpolateSpatial;
    }
    if (valueDesc.isCustom) interpFunc_ = valueDesc.interpFunc;
    KFSp_ThrowIf(KFS_SetValueDescription(this, &valueDesc, nullptr));
    AllocateCache();
    if (spatial && !IsCustom() && dimension <= 3) {
        KFSp_ThrowIf(KFS_SetStreamSParametrize(this, 1));
        if (spInterpMask & KFS_InterpMask_Negative) {
            KFSp_ThrowIf(KFSp_CheckStream(KFSp_Op_SetSpInterp, this, KFSp_Row_SetSpInterp));
            KFSp_ThrowIf(KFSp_CanDoSpInterp(this, KFS_SpInterp_Auto));
            spInterp_ = KFS_SpInterp_Auto;
        }
    }
    isWhole_ = true;
}

KFS_Stream::KFS_Stream(KFS_Stream const& source, KFS_CloneStreamParams const& params)
    : KFS_StreamBase(Undamaged(source)),
      stamp_(KFS_StreamValidStamp)
{
    TakeForm(source);  // in any case, for the way out of a failure
    int const code = KFSp_Boundary([&] {
        KFS_Stream const& seen = *source.GetKeyData()->stream;
        TakeForm(seen);
        keyData_.cache = seen.CloneCache(seen.GetCache());
        if (params.cloneKeys && seen.keyData_.keys) CopyKeysFrom(seen);
        if (params.cloneExpression && seen.HasExpression()) CopyExpressionFrom(seen);
    });
    if (code != 0) {
        if (keyData_.cache) static_cast<void>(KFSp_ClearCacheRecord(this, keyData_.cache));  // the first error wins
        SetCanonical(true);  // silent: listeners who hear the source have never seen this one, nor do they its end
        throw int{code};
    }
    isWhole_ = true;
}

// Canonical, so that nobody hears of it.
KFS_Stream::KFS_Stream(KFS_Stream const& original, KFS_StreamKeyData const& source)
    : KFS_StreamBase(nullptr, nullptr, true),
      original_(&original),
      stamp_(KFS_StreamValidStamp),
      keyData_(source, &original)
{
    TakeForm(original);
    exprInfo_ = original.exprInfo_;
    disabledUpdateCount_ = original.disabledUpdateCount_;
    // From here on the copy is this one's: K7, and the destructor gives back what the cache record holds.
    keyData_.stream = this;
    keyData_.valueOwner_ = nullptr;
    if (keyData_.keys) (*keyData_.keys)->refcon = this;
}

// What a stream is, beside its key data and its expression.
void KFS_Stream::TakeForm(KFS_Stream const& original)
{
    dimension_ = original.dimension_;
    kfsFlags_ = original.kfsFlags_;
    spInterp_ = original.spInterp_;
    spInterpMask_ = original.spInterpMask_;
    interpMask_ = original.interpMask_;
    timeScale_ = original.timeScale_;
    accuracy_ = original.accuracy_;
    multiplier_ = original.multiplier_;
    valueDesc_ = original.valueDesc_;
    interpFunc_ = original.interpFunc_;
    copyItemFunc_ = original.copyItemFunc_;
    disposeItemFunc_ = original.disposeItemFunc_;
    temporarilyNonCustom_ = original.temporarilyNonCustom_;
}

void KFS_Stream::ShowChangeInCopy() const
{
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    if (!isWhole_ || !context || !context->GetIsTempCloneContext()) [[likely]]
        return;
    KFS_StreamCacheState const* const state = KFSp_GetRenderStates(context).cacheState;
    KFS_StreamKeyData const* const copy = state ? state->Find(this) : nullptr;
    if (!copy) return;
    auto* const standIn = const_cast<KFS_Stream*>(copy->stream);
    standIn->TakeForm(*this);
    standIn->exprInfo_ = exprInfo_;
}

// Everything goes into the clone's own key data, whatever context the thread is in.
void KFS_Stream::CopyKeysFrom(KFS_Stream const& source)
{
    KFSp_ThrowIf(SEQ_Duplicate(source.GetKeys(), 0, &keyData_.keys));
    if (IsSpatial()) KFSp_ThrowIf(SEQ_ForEach(keyData_.keys, 0, KFSp_KeyClearRemap, 0));
    KFSp_ThrowIf(SEQ_SetRefcon(this, keyData_.keys));
    int const count = (*keyData_.keys)->count;
    if (HasKeys() && count > 0) {
        for (int* const stale : {keyData_.invalidKeyIndex, keyData_.arcInvalidKeyIndex}) {
            stale[0] = 0;
            stale[1] = count - 1;
        }
    }
}

void KFS_Stream::CopyExpressionFrom(KFS_Stream const& source)
{
    exprInfo_.SetExpression(source.exprInfo_.GetExpression());
    exprInfo_.SetFlags(source.exprInfo_.GetFlags());
    if (source.exprInfo_.HasExpressionError())
        exprInfo_.SetExpressionError(source.exprInfo_.GetExpressionError(), -1, u16str());
}

// The stream's own key data throughout, whatever context the thread is in. The client's dispose function still finds a
// whole stream, also for the current context's copy, which the next stream at this address mustn't be given.
KFS_Stream::~KFS_Stream()
{
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    if (std::exchange(isWhole_, false) && context && context->GetIsTempCloneContext()) {
        if (KFS_StreamCacheState* const state = KFSp_GetRenderStates(context).cacheState) state->Forget(this);
    }
    KFS_StreamCacheState::GiveBackSlot(this);
    static_cast<void>(KFSp_CheckStream(KFSp_Op_StreamDestroy, this, KFSp_Row_Dispose));
    if (keyData_.cache) static_cast<void>(KFSp_ClearCacheRecord(this, keyData_.cache));
    KFSp_DisposeKeyList(std::exchange(keyData_.keys, nullptr));
    exprInfo_.clear();
    FreeCache();
    // Volatile, because what is written to a dying object counts as never read, and checks of the stamp are to read it.
    *const_cast<unsigned short volatile*>(&stamp_) = KFS_StreamDeadStamp;
}

KFS_StreamBase* KFS_Stream::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new KFS_Stream(*this, params);
}

KFS_Stream* KFS_Stream::CloneLeaf(KFS_CloneStreamParams const& params) const
{
    return CloneStream(params)->GetAsLeaf();
}

KFS_Stream* KFS_Stream::CloneLeafNoKeysOrExpr() const
{
    return CloneLeaf(KFS_CloneStreamParams{false, false});
}

bool KFS_Stream::IsLeaf() const
{
    return true;
}

KFS_Stream* KFS_Stream::GetAsLeaf()
{
    return this;
}

KFS_Stream const* KFS_Stream::GetAsLeaf() const
{
    return this;
}

KFS_StreamKeyData const* KFS_Stream::GetKeyData() const
{
    Q_RenderContext const* const context = KFSp_PeekRenderContext();
    if (!context || !context->GetIsTempCloneContext()) [[likely]]
        return &keyData_;
    if (!isWhole_) return &keyData_;
    return KFSp_GetRenderStates(context).cacheState->GetOverrideKeyData(this, keyData_);
}

void KFS_Stream::SetKeys(SEQ_Head** keys)
{
    KFS_StreamKeyData* const data = GetKeyDataForModify();
    data->keys = keys;
    data->times.Drop();
}

bool KFS_Stream::HasActiveExpression() const
{
    return HasEnabledExpression() && !exprInfo_.HasExpressionError();
}

int KFS_Stream::GetKeyCount() const
{
    KFS_StreamKeyData const* const data = GetKeyData();
    return KFSp_KeyCount(data->stream, data);
}

bool KFS_Stream::HasNoValue() const
{
    KFS_StreamKeyData const* const data = GetKeyData();
    return KFSp_HasNoValue(data->stream, data);
}

void KFS_Stream::NotifyValueChanged()
{
    KFSp_Notify(
        this, [this](KFS_StreamListener* listener) { listener->StreamValueChanged(this); });
}

KFS_Stream::QuietExpressionErrorToken::QuietExpressionErrorToken(KFS_Stream* stream)
    : stream_(stream),
      saved_(stream->ExpressionErrorsAreQuiet())
{
    stream_->SetExpressionErrorsAreQuiet(true);
}

KFS_Stream::QuietExpressionErrorToken::~QuietExpressionErrorToken()
{
    stream_->SetExpressionErrorsAreQuiet(saved_);
}

int KFS_SetValueDescription(KFS_Stream* stream, KFS_ValueDesc const* newDesc, KFS_ValueDesc* oldDesc)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetValueDesc, stream, KFSp_Row_SetValueDesc)) return code;
    if (oldDesc) *oldDesc = *stream->GetValueDesc();
    if (!newDesc) return 0;
    if (stream->IsCustom() || newDesc->isCustom) stream->MarkTemporarilyNonCustom(!newDesc->isCustom);
    if (!newDesc->isCustom) stream->GetValueDescForModify()->isCustom = 0;
    int const code = newDesc->isCustom ? SetCustomDescription(stream, *newDesc) : SetPlainDescription(stream, *newDesc);
    stream->ShowChangeInCopy();
    return code;
}
