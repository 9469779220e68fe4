#pragma once

#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/stream.h"
#include "tree/paramdef.h"

#include <memory>
#include <optional>
#include <utility>

// A typed face for leaves. A traits class names the type of the value, and is read for nothing else:
//
//   struct OpacityTraits { using ValueType = double; };
//   class OpacityStream : public KFS_FloatStream<OpacityTraits> { ... };
//
// A value that GetValueEx or GetDefaultValue returns belongs to the caller, who gives it back through DisposeValue, once. The
// operations here do so around whatever fails.

// What FillInParamDef hands to FillInParamDefDetails. A host may give its traits a record by specialising
// KFS_ParamDetailsOf; without one the parameter record stays of no kind until the class fills it itself.
struct KFS_ParamDetails {
    int paramType = FX_Param_NotFilledIn;
    double validMin = 0.0, validMax = 0.0, sliderMin = 0.0, sliderMax = 0.0;
    short precision = 0;
};
template <class Traits>
inline constexpr std::optional<KFS_ParamDetails> KFS_ParamDetailsOf = std::nullopt;
// The slider range of kinds that have no slider.
inline constexpr double KFS_NoSlider = -9999.0;

// The default that a parameter record holds, as a number; 0.0 for kinds that have none.
inline double KFS_DefaultNumber(FX_ParamDef const& def)
{
    constexpr double FixedToDouble = 1.52587890625e-5;  // 1 / 65536
    switch (def.paramType) {
    case FX_Param_LAYER: return def.value.layer.layerDefault;
    case FX_Param_INT_SLIDER: return def.value.intSlider.defaultValue;
    case FX_Param_FIXED_SLIDER: return def.value.fixedSlider.defaultValue * FixedToDouble;
    case FX_Param_FIXED_ANGLE: return def.value.fixedAngle.defaultValue * FixedToDouble;
    case FX_Param_BOOL: return def.value.named.defaultValue;
    case FX_Param_CHOICE: return def.value.choice.defaultValue;
    case FX_Param_FLOAT_SLIDER: return static_cast<double>(def.value.floatSlider.defaultValue);
    case FX_Param_PATH: return def.value.path.defaultPathIdentifier;
    default: return 0.0;
    }
}

// The number that the bag of `eval` gives in place of the stream's value, on the heap; `value` stays as it was where none
// does. Throws boost::bad_get where an override gives no number, and what its value function throws.
KFS_API void KFS_ExtractOverrideNumber(KFS_Stream const* stream, KFS_EvalData const& eval, double*& value);

// Errors: operations throw the int codes of what they call, and disposal has then happened. A DisposeValue that throws while
// another exception unwinds ends the process.
//
// Threads: as KFS_Stream. SetValue, InsertDefaultKey, CopyDefaultKey and ForceKeyAtTime are edits.
template <class Traits>
class KFS_DerivedStream : public KFS_Stream {
public:
    using T = typename Traits::ValueType;
    using KFS_Stream::KFS_Stream;

    bool GetHideDimensionLock() const override { return false; }
    bool GetScaleBasedConstrainment() const override { return false; }
    bool ShouldWriteForVersion(CKF_File const* file) const override { return KFS_Stream::ShouldWriteForVersion(file); }
    u16str GetEnglishDisplayName() const override { return GetDisplayName(); }
    void FillInParamDef() const override
    {
        if constexpr (KFS_ParamDetailsOf<Traits>) {
            KFS_ParamDetails const& details = *KFS_ParamDetailsOf<Traits>;
            FillInParamDefDetails(details.paramType, details.validMin, details.validMax, details.sliderMin,
                                  details.sliderMax, details.precision, 0, 0, 0, 0);
        } else {
            KFS_Stream::FillInParamDef();
        }
    }
    // The display name of such a stream comes from the host.
    void FillInDisplayName() const override { pSetDisplayName(u16str()); }
    bool IsStaticValueModified() const override
    {
        Held standard(this, GetDefaultValue());
        Held value(this, GetValueEx({T_Time{0, 1}, 0, nullptr}));
        bool const differs = !(standard.value == value.value);
        value.Dispose();
        standard.Dispose();
        return differs;
    }
    void InsertDefaultKey(T_Time const& time) override
    {
        Held value(this, GetDefaultValue());
        SetValue(time, value.value);
        value.Dispose();
    }
    // Nothing, unless `source` is a stream of the same traits.
    void CopyDefaultKey(T_Time const& time, KFS_Stream const* source) override
    {
        auto const* const other = dynamic_cast<KFS_DerivedStream const*>(source);
        if (!other) return;
        Held value(other, other->GetDefaultValue());
        SetValue(time, value.value);
        value.Dispose();
    }
    void ValidateCacheAtTime(T_Time const& time) override
    {
        if (HasNoKeys())
            KFS_Stream::ValidateCacheAtTime(time);
        else
            DisposeValue(GetValueEx({time, KFS_EvalFlag_NoExpression, nullptr}));
    }
    void ForceInterpolateAtTime(T_Time const& time) override { DisposeValue(GetValueEx({time, 0, nullptr})); }
    // Compares the values with == where the keys alone don't tell.
    bool SameValueAtTimes(T_Time const& a, T_Time const& b, KFS_ParamBag const* bag) const override
    {
        if (KFS_Stream::SameValueAtTimes(a, b, bag)) return true;
        Held first(this, GetValueEx({a, 0, bag}));
        Held second(this, GetValueEx({b, 0, bag}));
        bool const same = first.value == second.value;
        first.Dispose();
        second.Dispose();
        return same;
    }
    // The untyped forms of the capsule operations, in terms of the typed ones.
    void ExtractCapsuleOverrideValue(void*& value, KFS_EvalData const& eval) const override
    {
        T* typed = static_cast<T*>(value);
        ExtractCapsuleOverrideValue(typed, eval);
        value = typed;
    }
    void DisposeCapsuleOverrideValue(void*& value) const override
    {
        T* typed = static_cast<T*>(value);
        DisposeCapsuleOverrideValue(typed);
        value = nullptr;
    }
    void ForceKeyAtTime(T_Time const& time) override
    {
        Held value(this, GetValueEx({time, KFS_EvalFlag_NoExpression, nullptr}));
        SetValue(time, value.value);
        value.Dispose();
    }
    bool IsSeparationLeader() const override { return false; }
    bool IsCustomValuePointer() const override { return false; }

    // The value at a time; `flags` and `bag` as in KFS_EvalData.
    virtual T GetValue(T_Time const& time, int flags) const { return GetValueEx({time, flags, nullptr}); }
    virtual T GetValue(T_Time const& time, KFS_ParamBag const* bag, int flags) const
    {
        return GetValueEx({time, flags, bag});
    }
    virtual T GetValueEx(KFS_EvalData const& eval) const = 0;
    // A value on the heap that an override gives in place of the stream's; the pointer stays as it was without one, and
    // always in a class that doesn't say how.
    virtual void ExtractCapsuleOverrideValue(T*&, KFS_EvalData const&) const {}
    virtual void DisposeCapsuleOverrideValue(T*& value) const
    {
        if (!value) return;
        DisposeValue(*value);
        delete value;
        value = nullptr;
    }
    virtual void SetValue(T_Time const& time, T const& value) = 0;
    virtual void DisposeValue(T) const {}
    virtual T GetDefaultValue() const { return GetDefaultValueFromParamDef(); }
    virtual T GetDefaultValueFromParamDef() const { return T{}; }

private:
    // A value that is given back when its scope ends, unless it has been.
    struct Held {
        Held(KFS_DerivedStream const* from, T held) : value(std::move(held)), stream(from) {}
        Held(Held const&) = delete;
        Held& operator=(Held const&) = delete;
        ~Held()
        {
            if (stream) stream->DisposeValue(value);
        }
        void Dispose()
        {
            KFS_DerivedStream const* const owner = std::exchange(stream, nullptr);
            owner->DisposeValue(value);
        }

        T value;
        KFS_DerivedStream const* stream;
    };
};

template <class Traits>
class KFS_FloatBasedStream : public KFS_DerivedStream<Traits> {
public:
    using KFS_DerivedStream<Traits>::KFS_DerivedStream;

    bool IsFloatBased() const override { return true; }
    bool HasMinValue() const override { return false; }
    bool HasMaxValue() const override { return false; }
};

// A double in keys, read and written through the double forms, so that separated dimensions and overrides work.
template <class Traits>
class KFS_FloatStream : public KFS_FloatBasedStream<Traits> {
public:
    using KFS_FloatBasedStream<Traits>::KFS_FloatBasedStream;
    using KFS_DerivedStream<Traits>::ExtractCapsuleOverrideValue;

    void ExtractCapsuleOverrideValue(double*& value, KFS_EvalData const& eval) const override
    {
        KFS_ExtractOverrideNumber(this, eval, value);
    }
    double GetValueEx(KFS_EvalData const& eval) const override
    {
        double value = 0.0;
        if (int const code = KFS_GetValueFPlus(this, &eval.time, eval.flags, &value, nullptr, eval.bag))
            throw int{code};
        return value;
    }
    void SetValue(T_Time const& time, double const& value) override
    {
        this->PrepareSetValue(time);
        if (int const code = KFS_InsertKeyF(this, &time, 1, &value, 0, 0)) throw int{code};
    }
    // Vectors of the value and three zeros.
    M_Vector4T<double> GetVector4Ex(KFS_EvalData const& eval) const override
    {
        return {{GetValueEx(eval), 0.0, 0.0, 0.0}};
    }
    M_Vector4T<double> GetDefaultVector4() const override { return {{this->GetDefaultValue(), 0.0, 0.0, 0.0}}; }
    void SetVector4(T_Time const& time, M_Vector4T<double> const& value) override { SetValue(time, value[0]); }
    // The default in the parameter record; 0.0 for kinds without a number. While the record is just being filled in, which
    // asks for the default, it is 0.0 too: a class that gives neither would ask itself for ever.
    double GetDefaultValueFromParamDef() const override
    {
        if (this->IsFillingInParamDef()) return 0.0;
        return KFS_DefaultNumber(this->GetParamDef());
    }
};

// A stream with an English display name of its own: what the message of KFS_StreamBase::SetEnglishDisplayName asks for.
template <class Base>
class KFS_DynamicEnglishDisplayNameNonLeaf : public Base {
public:
    using Base::Base;

    u16str GetEnglishDisplayName() const override
    {
        return englishDisplayName_.empty() ? Base::GetEnglishDisplayName() : englishDisplayName_;
    }
    void SetEnglishDisplayName(u16str const& name) override { englishDisplayName_ = name; }

protected:
    KFS_DynamicEnglishDisplayNameNonLeaf(KFS_DynamicEnglishDisplayNameNonLeaf const& source,
                                         KFS_CloneStreamParams const& params)
        : Base(source, params),
          englishDisplayName_(source.englishDisplayName_)
    {}

private:
    u16str englishDisplayName_;
};
