#pragma once

#include "frame/services/identifiers.h"
#include "frame/services/math.h"
#include "frame/services/time.h"
#include "keystore/keytimes.h"
#include "keystore/keytypes.h"
#include "overrides/expression.h"
#include "tree/streambase.h"

#include <atomic>
#include <vector>

class KFS_ParamBag;
class KFS_StreamCacheState;

// A read request as one value.
struct KFS_EvalData {
    T_Time time;
    int flags;                // of the Plus forms: bit 0x1 means no expression, the others are the host's
    KFS_ParamBag const* bag;  // may be null
};

// The part of a stream of which a render has a private copy.
//
// Reads write it: the cache record is scratch, and derived data of stale keys is repaired where it is needed. So one
// key data serves one thread at a time.
//
// What always holds, between any two operations of the library; code that relies on one names its number:
//   K1  Times ascend and no two keys share one, as signed differences with wrap-around (KFSp_TimeDifference).
//   K2  No key stands at KFS_INVALID_INDEX.
//   K3  The first and the last key aren't float keys in what they do, whatever their flags say.
//   K4  A key's flag KFS_KeyFlag_SpatialBlock, and nothing else, says where its value data begins.
//   K5  An arc table belongs to one key: a copy of the key has none.
//   K6  Derived data of a key outside the two stale ranges is right; a range has both ends or neither, and lies within
//       the list.
//   K7  The list's refcon is `stream`, by which the item functions find what the items are.
// The cache record:
//   C1  It is empty exactly if its time is KFS_INVALID_INDEX; then its value data belongs to nobody.
//   C2  Not empty, it owns its value; of a constant (KFS_StreamFlag_NoKeys) that is the stream's value.
//   C3  On a stream with keys it is what a read at its time answers, or empty. An edit leaves it empty.
//   C4  It never has an arc table.
// The packed times:
//   T1  If they mirror as many keys as the list has, they are the keys' times in order. Whoever inserts, removes or
//       retimes a key goes through keystore/keylist_private.h, or drops them.
struct KFS_API KFS_StreamKeyData {
    // The stream as this data's reader sees it: for a stream's own data the stream itself, for a render's private copy
    // its stand-in, which says what the stream was when the copy was made.
    KFS_Stream const* stream = nullptr;
    SEQ_Head** keys = nullptr;                                        // null while none was made
    int invalidKeyIndex[2] = {KFS_INVALID_INDEX, KFS_INVALID_INDEX};  // first and last key whose tangents are stale
    int arcInvalidKeyIndex[2] = {KFS_INVALID_INDEX,
                                 KFS_INVALID_INDEX};  // the same for arc lengths and spatial tangents
    KFS_KeyScalar* cache = nullptr;                   // with room for a full value
    mutable KFS_KeyTimes times;                       // derived from `keys`

    explicit KFS_StreamKeyData(KFS_Stream const* owner) : stream(owner) {}
    // A copy that shares nothing with `source`, the data of `owner`. Throws an int: the list service's code, 4, or the
    // copy function's.
    KFS_StreamKeyData(KFS_StreamKeyData const& source, KFS_Stream const* owner);
    ~KFS_StreamKeyData();
    KFS_StreamKeyData(KFS_StreamKeyData const&) = delete;
    KFS_StreamKeyData& operator=(KFS_StreamKeyData const&) = delete;

private:
    friend class KFS_Stream;

    // In a copy: the stream whose dispose function gives back what the cache record holds. Null where nothing has to be
    // given back, so that the copy of a plain stream may outlive the stream.
    KFS_Stream const* valueOwner_ = nullptr;
};

// The leaf of a stream tree: one animatable property. It holds a single value (KFS_StreamFlag_NoKeys, the value lives
// in the cache record), or a sorted list of keys.
//
// Errors: exported functions on a stream refuse one whose validity stamp is wrong with code 2 and touch nothing else of
// it. Class operations throw their code as an int.
// Threads: edits belong to the main thread. Accessors marked "key data" answer for the calling thread's key data: the
// stream's own, or on a temporary clone context that render's private copy. What reads answer there is the stream as it
// stood when the copy was made, whatever the main thread edits meanwhile: keys, time scale, description, constant or
// keyed, the text and flags of its expression. The other accessors answer for the stream as it is now.
class KFS_API KFS_Stream : public KFS_StreamBase {
public:
    // `dimension`: components of the value. `timeScale`: time units a second. `spatial`: keys carry tangents in space.
    // `valueDesc`: what a value is. `matchName` and `factory` may be null. Throws an int: 7433 for a data type above 9,
    // 4 when out of memory, 7431 where automatic spatial tangents are asked for (bit 0x8 of `spInterpMask`) but
    // `interpMask` lacks bit 0x4.
    KFS_Stream(short dimension, unsigned int timeScale, unsigned char noKeys, unsigned char spatial,
               unsigned short interpMask, unsigned short spInterpMask, KFS_ValueDesc const& valueDesc,
               KFS_MatchName const* matchName, KFS_StreamFactory* factory, bool canonical);
    // A stream in its own right without a parent. Throws an int.
    KFS_Stream(KFS_Stream const& source, KFS_CloneStreamParams const& params);
    ~KFS_Stream() override;

    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    // The clone as a leaf; without keys and expression it holds the value of the cache record. The caller owns it.
    KFS_Stream* CloneLeaf(KFS_CloneStreamParams const& params) const;
    KFS_Stream* CloneLeafNoKeysOrExpr() const;
    // Exchanges the content of two leaves, names and flags included, while each keeps its place: parent, factory,
    // client pointer, and the permitted temporal interpolations. Listeners hear of this one only. Throws the list
    // service's code, with the content exchanged.
    void swap(KFS_Stream& other);
    bool IsModified() const override;
    // Keys, or an expression (`evenIfDisabled`: any text; else one that is active). A stream with separated dimensions
    // asks its followers.
    bool IsAnimated(bool evenIfDisabled) const override;
    bool IsLeaf() const override;
    KFS_Stream* GetAsLeaf() override;
    KFS_Stream const* GetAsLeaf() const override;
    void SetStreamBaseFlags(unsigned int value, unsigned int mask) override;
    bool AreDimensionsSeparated() const override;
    void SetDimensionsSeparated(bool separated) override;
    bool AffectsRendering(KFS_RenderOptionsBase const& options) const override;
    // What identifies the leaf's values over the span of the options: as few of its keys as shape them, or samples of its
    // expression. Throws an int. A negative cacheCompareSamplesPerSecond in the expression's text becomes its error.
    hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const& options,
                                        GetRenderGuidFilter* filter) const override;
    void GetExpressionDependencyIds(std::set<int>& ids) const override;
    // The stream as one "LIST" of type "kfbs", to be read back by a stream of the same class. Both throw an int: the
    // chunk service's or the list service's code, or one that has been reported.
    //
    // Read takes the list that the caller has entered; null stands for the next one at the file's place. It replaces
    // what the stream had. A failed Read leaves a whole stream with some of the file's content. A stream of exactly
    // this class takes its dimension and value description from the file, unless a client's item functions couldn't take
    // such values (KFS_Err_BadValueDesc); one of a derived class keeps its own, and refuses another dimension with
    // KFS_Err_BadFileInfo.
    void Read(CKF_File* file, CKF_ChunkInfo const* chunk) override;
    bool ShouldWriteForVersion(CKF_File const* file) const override;
    void Write(CKF_File* file) const override;

    virtual bool CanHaveExpression() const;
    virtual bool CanBeAnimated() const;
    virtual bool IsHoldOnly() const;
    virtual bool NeedsResetAfterStored() const;
    virtual bool IsStaticValueModified() const;
    virtual void InsertDefaultKey(T_Time const& time);
    virtual void CopyDefaultKey(T_Time const& time, KFS_Stream const* source);
    virtual void PrepareForInsertOfForeignValue(KFS_Stream const* source);
    // Leaves the value at a time in the cache record, so that the next read at that time is free. A constant only takes
    // the time.
    virtual void ValidateCacheAtTime(T_Time const& time);
    virtual void ForceInterpolateAtTime(T_Time const& time);
    // Whether both times give the same value, as far as can be told without evaluating. Throws an int.
    virtual bool SameValueAtTimes(T_Time const& a, T_Time const& b, KFS_ParamBag const* bag) const;
    // Feeds the value at a time to an identity: the components of GetVector4Ex, none for kinds without a value. A class
    // whose value isn't in there overrides the second form. Throws an int.
    virtual void MixInValueAtTime(hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>& hash,
                                  T_Time const& time) const;
    virtual void MixInValueAtTime(hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>& hash,
                                  T_Time const& time, KFS_ParamBag const* bag) const;
    virtual bool HasMinValue() const;
    virtual bool HasMaxValue() const;
    virtual short GetEffectiveDimension() const;
    virtual double GetMinValue() const;
    virtual double GetMaxValue() const;
    virtual short GetPrecision() const;
    // Forces `dimension` doubles into the stream's limits. A plain leaf has none.
    virtual void LegalizeValue(double* values) const;
    virtual double GetUIMinValue() const;
    virtual double GetUIMaxValue() const;
    virtual void SetUIMinValue(double value);
    virtual void SetUIMaxValue(double value);
    virtual M_Vector4T<double> GetVector4(T_Time const& time, int flags) const;
    virtual M_Vector4T<double> GetVector4(T_Time const& time, KFS_ParamBag const* bag, int flags) const;
    virtual M_Vector4T<double> GetVector4Ex(KFS_EvalData const& eval) const;
    virtual M_Vector4T<double> GetDefaultVector4() const;
    virtual void SetVector4(T_Time const& time, M_Vector4T<double> const& value);
    virtual void ExtractCapsuleOverrideValue(void*& value, KFS_EvalData const& eval) const;
    virtual void DisposeCapsuleOverrideValue(void*& value) const;
    virtual void ForceKeyAtTime(T_Time const& time);
    // On a stream with keys, makes sure that a key stands at the time. Throws an int.
    virtual void PrepareSetValue(T_Time const& time);
    virtual u16str GetUnitsName() const;
    virtual u16str GetEnglishUnitsName() const;
    virtual u16str GetDimensionName(short dimension) const;
    virtual u16str GetEnglishDimensionName(short dimension) const;
    virtual u16str GetExprPreEvalString() const;
    virtual bool IsSeparationLeader() const;
    virtual bool IsSeparationFollower() const;
    virtual int GetSeparationDimension() const;
    virtual KFS_Stream* GetSeparationLeader();
    virtual KFS_Stream const* GetSeparationLeader() const;
    virtual void GetSeparationFollowers(std::vector<KFS_Stream*>& followers);
    virtual void GetSeparationFollowers(std::vector<KFS_Stream const*>& followers) const;
    virtual KFS_Stream* GetSeparationFollower(int dimension);
    virtual KFS_Stream const* GetSeparationFollower(int dimension) const;
    // Whether a custom value is a pointer, or otherwise means nothing outside this run. Such values aren't in files: after
    // Read a constant has the value that it had before, or its default (InsertDefaultKey) where it had none, and each key
    // has zero bytes, a null pointer. The class's own Read puts in what it saves itself, once KFS_Stream::Read is through;
    // its item and interpolation functions must take a null pointer. Of a class that answers false the file's bytes are
    // the values, and its functions are handed them.
    virtual bool IsCustomValuePointer() const;
    // Runs the expression at the tree's root. 1 means that there is no value.
    [[nodiscard]] virtual int EvaluateExpression(T_Time const* time, double* values, void** customValue,
                                                 KFS_ParamBag const* bag) const;

    // Describes the stream in its parameter record: what FillInParamDef of a typed stream calls. `paramType` is one of
    // FX_ParamKind; the numbers go where records of that kind have a place for them, 16.16 numbers rounded, others cut off
    // at the point; the default is component by component that of GetDefaultVector4. Throws an int. Threads: any number
    // at once, with the same content.
    void FillInParamDefDetails(int paramType, double validMin, double validMax, double sliderMin, double sliderMax,
                               short precision, short displayFlags, unsigned int floatFlags, int reservedWord,
                               int paramFlags) const;
    // Whether that is going on, on this thread: the default can't come from the record then.
    bool IsFillingInParamDef() const;

    unsigned short GetStamp() const { return stamp_; }

    unsigned short GetKFSFlags() const { return kfsFlags_; }
    void SetKFSFlags(unsigned short flags) { kfsFlags_ = flags; }
    unsigned short* GetKFSFlagsForModify() { return &kfsFlags_; }
    bool HasNoKeys() const { return (kfsFlags_ & KFS_StreamFlag_NoKeys) != 0; }
    bool HasKeys() const { return !HasNoKeys(); }
    bool IsSpatial() const { return (kfsFlags_ & KFS_StreamFlag_Spatial) != 0; }
    bool IsSParametrized() const { return (kfsFlags_ & KFS_StreamFlag_SParametrize) != 0; }
    bool IsCustom() const { return valueDesc_.isCustom != 0; }

    // Key data.
    KFS_StreamKeyData const* GetKeyData() const;
    KFS_StreamKeyData* GetKeyDataForModify() const { return const_cast<KFS_StreamKeyData*>(GetKeyData()); }
    // The stream that a stand-in in a render's copy stands for; of any other stream the stream itself.
    KFS_Stream const* GetOriginal() const { return original_; }
    // On a temporary clone context an edit works on that render's copy. Whoever has changed there what isn't key data
    // (flags, time scale, description, expression) calls this, and the copy's reads see it. Does nothing elsewhere.
    void ShowChangeInCopy() const;
    SEQ_Head** GetKeys() const { return GetKeyData()->keys; }
    // Takes over a list whose head names this stream; the earlier one isn't disposed. Also to be called by whoever has
    // rewritten the times of keys through the list's handle.
    void SetKeys(SEQ_Head** keys);
    KFS_KeyScalar* GetCache() const { return GetKeyData()->cache; }
    int const* GetInvalidKeyIndex() const { return GetKeyData()->invalidKeyIndex; }
    int* GetInvalidKeyIndexForModify() const { return GetKeyDataForModify()->invalidKeyIndex; }
    int const* GetArcInvalidKeyIndex() const { return GetKeyData()->arcInvalidKeyIndex; }
    int* GetArcInvalidKeyIndexForModify() const { return GetKeyDataForModify()->arcInvalidKeyIndex; }

    unsigned int GetTimeScale() const { return timeScale_; }
    void SetTimeScale(unsigned int timeScale) { timeScale_ = timeScale; }
    short GetDimension() const { return dimension_; }
    void SetDimension(short dimension) { dimension_ = dimension; }
    KFS_ValueDesc const* GetValueDesc() const { return &valueDesc_; }
    KFS_ValueDesc* GetValueDescForModify() { return &valueDesc_; }
    unsigned short GetSpInterp() const { return spInterp_; }
    void SetSpInterp(unsigned short spInterp) { spInterp_ = spInterp; }
    unsigned short GetSpInterpMask() const { return spInterpMask_; }
    void SetSpInterpMask(unsigned short mask) { spInterpMask_ = mask; }
    unsigned short GetInterpMask() const { return interpMask_; }
    void SetInterpMask(unsigned short mask) { interpMask_ = mask; }
    M_Vector4T<double> const& GetMultiplier() const { return multiplier_; }
    M_Vector4T<double>* GetMultiplierForModify() { return &multiplier_; }
    // The square of the accuracy that KFS_GetStreamAccuracy answers.
    double GetAccuracy() const { return accuracy_; }
    void SetAccuracy(double accuracy) { accuracy_ = accuracy; }
    KFS_InterpFunc GetInterpFunc() const { return interpFunc_; }
    void SetInterpFunc(KFS_InterpFunc func) { interpFunc_ = func; }
    KFS_CopyItemFunc GetCopyItemFunc() const { return copyItemFunc_; }
    void SetCopyItemFunc(KFS_CopyItemFunc func) { copyItemFunc_ = func; }
    KFS_DisposeItemFunc GetDisposeItemFunc() const { return disposeItemFunc_; }
    void SetDisposeItemFunc(KFS_DisposeItemFunc func) { disposeItemFunc_ = func; }
    // The word handed to the item functions: the description's data type on a custom stream (its low 32 bits), 0 on a
    // plain one.
    long GetItemRefcon() const { return IsCustom() ? static_cast<int>(valueDesc_.dataType) : 0; }

    KFS_ExprInfo const& GetExprInfo() const { return exprInfo_; }
    KFS_ExprInfo& GetExprInfoForModify() { return exprInfo_; }
    unsigned int GetExpressionFlags() const { return exprInfo_.GetFlags(); }
    bool HasExpression() const { return exprInfo_.HasExpression(); }
    u16str GetExpression() const { return exprInfo_.GetExpression(); }
    // With text, and not switched off.
    bool HasEnabledExpression() const { return HasExpression() && !exprInfo_.GetFlag(KFS_ExprFlag_Disabled); }
    // An error counts only beside a text.
    bool HasExpressionError() const { return HasExpression() && exprInfo_.HasExpressionError(); }
    // With text, not switched off, without an error.
    bool HasActiveExpression() const;

    // Set while a custom stream is given a plain description for a while.
    bool IsTemporarilyNonCustom() const { return temporarilyNonCustom_; }
    void MarkTemporarilyNonCustom(bool on) { temporarilyNonCustom_ = on; }
    // These count, so calls nest.
    bool CanUpdateStream() const { return disabledUpdateCount_ == 0; }
    void SetDisabledUpdateStream(bool disabled) { disabledUpdateCount_ += disabled ? 1U : ~0U; }
    bool CanLegalizeValue() const { return disabledLegalizeCount_ == 0; }
    void DisableLegalizeValue(bool disabled) { disabledLegalizeCount_ += disabled ? 1U : ~0U; }
    void SetExpressionErrorsAreQuiet(bool quiet) { expressionErrorsAreQuiet_ = quiet; }
    bool ExpressionErrorsAreQuiet() const { return expressionErrorsAreQuiet_; }

    // Silences expression errors for a scope.
    class KFS_API QuietExpressionErrorToken {
    public:
        explicit QuietExpressionErrorToken(KFS_Stream* stream);
        ~QuietExpressionErrorToken();
        QuietExpressionErrorToken(QuietExpressionErrorToken const&) = delete;
        QuietExpressionErrorToken& operator=(QuietExpressionErrorToken const&) = delete;

    private:
        KFS_Stream* stream_;
        bool saved_;
    };

    // The cache record: GetCacheSize bytes, zeroed, empty. Throws the int 4.
    KFS_KeyScalar* AllocateCacheImpl() const;
    void AllocateCache();
    void FreeCache();
    int GetCacheSize() const;
    // A copy that owns its value. Throws an int.
    KFS_KeyScalar* CloneCache(KFS_KeyScalar const* source) const;

    // The number of keys, the count against which ends of the list are compared: on a stream without a list 0 while it
    // has no value, else -1. Key data.
    int GetKeyCount() const;
    // Whether the stream has nothing to answer: no key, or a constant without a value. Key data.
    bool HasNoValue() const;

    // Mark the keys from `index` - `count` to `index` as stale; `index` -1 counts from the end. Key data. They answer
    // the list service's code.
    [[nodiscard]] int SetInvalid(int index, short count) const;
    [[nodiscard]] int SetArcInvalid(int index, short count) const;

    // Repairs what is stale: spatial tangents and arcs, temporal tangents, float times, in this order. Const, because
    // it writes derived data only. Key data. The marks are consumed whether or not the repair finished.
    [[nodiscard]] int UpdateStream() const;
    [[nodiscard]] int UpdateStreamIfStaleTangents(int index) const;
    [[nodiscard]] int UpdateStreamIfFloatItem(KFS_KeyScalar const* key, int index) const;

    // The list side of removing a key. With `keepInCache` the key moves into the cache record.
    [[nodiscard]] int RemoveKey(int index, unsigned char keepInCache);
    // Moves the stream between one value and keys. With `keepValue` a constant's value becomes the first key.
    [[nodiscard]] int SetConstant(unsigned char constant, unsigned char keepValue);
    // Makes a stream with keys that can't be animated a constant, with its value at time 0. Throws an int.
    void SetConstantIfNotAnimatable();

    void NotifyValueChanged();

private:
    friend class KFS_StreamCacheState;
    friend struct KFSp_StandIn;      // makes them
    friend struct KFSp_KeyDataDoor;  // reads that have the thread's context at hand

    // The stand-in for `original` in a render's copy of its key data.
    explicit KFS_Stream(KFS_Stream const& original, KFS_StreamKeyData const& source);
    void TakeForm(KFS_Stream const& original);
    unsigned int IndexInLayout(KFS_NamedStreamGroup const* group) const;
    void CopyKeysFrom(KFS_Stream const& source);
    void CopyExpressionFrom(KFS_Stream const& source);

    // What is rarely looked at.
    KFS_Stream const* original_ = this;
    double accuracy_ = 0.0001;
    M_Vector4T<double> multiplier_;
    bool temporarilyNonCustom_ = false;
    bool expressionErrorsAreQuiet_ = false;
    // While it is made and unmade, a stream has its own key data alone.
    bool isWhole_ = false;
    unsigned short spInterp_ = KFS_SpInterp_None;
    unsigned short spInterpMask_;
    unsigned short interpMask_;
    unsigned int disabledUpdateCount_ = 0;
    unsigned int disabledLegalizeCount_ = 0;
    mutable std::atomic<unsigned int> lastIndexInLayout_{0};  // a guess: reads of a separated leader ask each time
    // What each read looks at, side by side.
    KFS_CopyItemFunc copyItemFunc_ = nullptr;
    // By which renders find their copies; 0 until the first one asks.
    mutable std::atomic<unsigned int> renderSlot_{0};
    unsigned short stamp_;
    short dimension_;
    unsigned short kfsFlags_ = 0;
    unsigned int timeScale_;
    KFS_ValueDesc valueDesc_;
    KFS_InterpFunc interpFunc_;
    KFS_DisposeItemFunc disposeItemFunc_ = nullptr;
    KFS_ExprInfo exprInfo_;
    KFS_StreamKeyData keyData_{this};
};

// Changes what a value of the stream is; the old description goes to `oldDesc` if that isn't null, and a null `newDesc`
// changes nothing. A custom stream that is given a plain description counts as custom again once a custom one comes
// back. The cache record and the key list keep their sizes: whoever makes the values of a live stream larger calls
// AllocateCache after it and gives the stream a new list. Doesn't notify. Operation 9. Errors: 2; 7433 for a data type
// above 9, not reported.
[[nodiscard]] KFS_API int KFS_SetValueDescription(KFS_Stream* stream, KFS_ValueDesc const* newDesc,
                                                  KFS_ValueDesc* oldDesc);
