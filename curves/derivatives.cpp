// Rates of change and directions of motion. Above the key store, because a rate is a question to the curve.
#include "curves/derivatives.h"

#include "curves/interpolate_private.h"
#include "curves/keyhandles_private.h"
#include "curves/neighbours_private.h"
#include "curves/spacetangents.h"
#include "curves/spatial_private.h"
#include "curves/tangents.h"
#include "frame/boundary_private.h"
#include "frame/messages_private.h"
#include "frame/services/memory.h"
#include "frame/timehelpers.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/evaluate.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/lookup.h"
#include "keystore/pins_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cmath>
#include <cstring>
#include <optional>
#include <utility>
#include <vector>

namespace {

// A rate between these counts as standing still when followers are asked for a direction.
constexpr double Still = 1e-12;
constexpr int MostTrials = 29;
constexpr std::size_t LeastVector = 4;  // doubles that an expression may write, whatever the dimension

struct Question {
    KFS_Stream const* stream;  // the caller's, which has a place in a tree
    KFS_Stream const* seen;    // as this thread's reads see it: what it is made of, and its keys
    int time = 0;              // in its scale
    char tangentMode;
    bool keyOnly;
    int flags;
    KFS_ParamBag const* bag;

    bool WantsSpeed() const { return tangentMode == KFS_Deriv_Velocity && seen->IsSpatial(); }
    int Elements() const { return WantsSpeed() ? 1 : seen->GetDimension(); }
};

int OneUnitLater(int time)
{
    return static_cast<int>(static_cast<unsigned int>(time) + 1U);
}

// ---- expressions

int Sample(Question const& asked, int time, KFS_DerivSampleFilter const& filter, double* value)
{
    T_Time const at{time, asked.seen->GetTimeScale()};
    if (int const code = KFS_GetValueFPlus(asked.stream, &at, 0, value, nullptr, asked.bag)) return code;
    return filter ? filter(value) : 0;
}

// The difference to the value one unit of time later.
int DeriveExpression(Question const& asked, double* value, KFS_DerivSampleFilter const& sampleFilter,
                     KFS_DerivFilter const& filter)
{
    if (!value) return 0;
    auto const dimension = static_cast<std::size_t>(std::max<short>(asked.seen->GetDimension(), 0));
    std::vector<double> now(std::max(dimension, LeastVector)), later(now);
    KFSp_ThrowIf(Sample(asked, asked.time, sampleFilter, now.data()));
    KFSp_ThrowIf(Sample(asked, OneUnitLater(asked.time), sampleFilter, later.data()));
    double const scale = asked.seen->GetTimeScale();
    for (std::size_t i = 0; i < dimension; ++i) later[i] = (later[i] - now[i]) * scale;
    if (asked.WantsSpeed()) {
        *value = std::sqrt(KFSp_SquaredLength({later.data(), dimension}));
        KFSp_ThrowIf(filter ? filter(value, true) : 0);
        return 0;
    }
    for (std::size_t i = 0; i < dimension; ++i) {
        KFSp_ThrowIf(filter ? filter(&later[i], false) : 0);
        value[i] = later[i];
    }
    return 0;
}

// ---- keys

void Zero(Question const& asked, double* value)
{
    std::fill_n(value, std::max(asked.Elements(), 0), 0.0);
}

int TangentOfKey(Question const& asked, int index, double* value)
{
    bool const isLast = index == asked.seen->GetKeyCount() - 1;
    int const code =
        KFS_GetKeySpaceTangentsF(asked.stream, index, 0, isLast ? value : nullptr, isLast ? nullptr : value);
    if (code == 0 && isLast)
        for (int i = 0; i < asked.seen->GetDimension(); ++i) value[i] = -value[i];
    return code;
}

int VelocityOfKey(Question const& asked, int index, double* value)
{
    bool const isLast = index == asked.seen->GetKeyCount() - 1;
    Zero(asked, value);  // codes without a shape have no speed, and write none
    return KFS_GetKeyVelocityF(asked.stream, index, 1, isLast ? value : nullptr, isLast ? nullptr : value);
}

// Takes an interpolation's numbers out of the cache record, which never holds a rate.
int TakeFromCache(Question const& asked, KFS_StreamKeyData const* data, int code, double* value)
{
    data->cache->time = KFS_INVALID_INDEX;
    if (code == 0) std::copy_n(KFSp_Numbers(data->cache), asked.Elements(), value);
    return code;
}

// The keys that a speed lies between.
struct Segment {
    KFS_KeyScalar const* a = nullptr;
    KFS_KeyScalar const* b = nullptr;
    int aIndex = KFS_INVALID_INDEX;
};

// Nearly always the keys at `next` - 1 and `next`. On a path a float key at the time is passed over, and where arc lengths
// count so are those around it; then an end may be missing.
int FindSegment(Question const& asked, KFS_StreamKeyData const* data, int next, Segment* segment)
{
    auto const [a, b] = KFSp_GetKeyPair(data, next - 1);
    bool const anchorsOnly = asked.seen->IsSpatial() && asked.seen->IsSParametrized();
    bool const asTheyAre = (KFSp_HasShortcuts || a) && b->time != asked.time;
    if (asTheyAre && !(anchorsOnly && (KFSp_Roves(data, a, next - 1) || KFSp_Roves(data, b, next)))) {
        *segment = {a, b, next - 1};
        return 0;
    }
    KFSp_Neighbours around;
    int const code = KFSp_FindAround(asked.seen, asked.time, 0, &around);
    *segment = {around.prev, around.next, around.prevIndex};
    return code;
}

// The slopes that KFS_GetKeyVelocityF has for the key in front of a straight segment.
int SlopeOfLine(Question const& asked, Segment const& segment, double* value)
{
    if (!KFSp_HasHandleRuns(asked.seen)) return KFS_GetKeyVelocityF(asked.stream, segment.aIndex, 1, nullptr, value);
    KFSp_FillSlopes(asked.seen, segment.a, segment.b, value);
    value[0] = KFSp_SettledSpeed(value[0]);
    return 0;
}

int VelocityInGap(Question const& asked, KFS_StreamKeyData const* data, int next, double* value)
{
    Segment segment;
    if (int const code = FindSegment(asked, data, next, &segment)) return code;
    auto const kind = segment.a && segment.b ? KFSp_GetSegmentKind(segment.a->outInterp, segment.b->inInterp)
                                             : KFSp_SegmentKind::Hold;
    if (kind == KFSp_SegmentKind::Linear) return SlopeOfLine(asked, segment, value);
    if (kind != KFSp_SegmentKind::Curved) {  // held, or codes without a shape
        Zero(asked, value);
        return 0;
    }
    auto const derive = asked.seen->IsSpatial() ? &KFSp_InterpDerivSpatial : &KFSp_InterpDeriv;
    return TakeFromCache(asked, data, derive(asked.seen, 0, asked.time, next - 1), value);
}

int VelocityBetweenKeys(Question const& asked, KFS_StreamKeyData const* data, int next, double* value)
{
    if (next == 0 || next >= KFSp_ItemCount(data)) {
        Zero(asked, value);
        return 0;
    }
    if (KFSp_HasShortcuts && !asked.seen->IsSpatial()) return VelocityInGap(asked, data, next, value);
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (error.None()) error.Keep(VelocityInGap(asked, data, next, value));
    }
    return error.Code();
}

// A plain stream has no path between its keys either: it is refused as at a key.
int TangentBetweenKeys(Question const& asked, KFS_StreamKeyData const* data, int next, double* value)
{
    KFS_Stream const* const stream = asked.seen;
    int const last = KFSp_ItemCount(data) - 1;
    if (next == 0 || next > last || !stream->IsSpatial()) return TangentOfKey(asked, std::min(next, last), value);
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (!error.None()) return error.Code();
        if (!stream->GetInterpFunc())  // told, and no failure
            static_cast<void>(KFSp_ReportRow(KFSp_Op_GetTangent, 0, KFSp_Row_NoInterpFunc));
        error.Keep(TakeFromCache(asked, data, KFSp_InterpTangentSpatial(stream, 0, asked.time, next - 1), value));
    }
    return error.Code();
}

// The derivative that the keys give.
int DeriveKeys(Question const& asked, double* value, unsigned char* atKey)
{
    KFS_Stream const* const stream = asked.seen;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_GetDeriv, KFS_Err_NoKeys, KFSp_Row_GetValue);
    if (stream->HasNoKeys()) {
        if (asked.time != KFS_INVALID_INDEX) data->cache->time = asked.time;
        if (atKey) *atKey = 1;
        if (value && stream->GetDimension() >= 1) Zero(asked, value);
        return 0;
    }
    if (stream->IsCustom() && (!stream->IsSpatial() || asked.tangentMode == KFS_Deriv_SpaceTangent))
        return KFSp_RefuseCustomValue(KFSp_Op_GetDeriv, KFSp_Row_ComputeDerivative);

    // Tangents, arcs and float times are about to be read.
    if (KFSp_IsStale(data)) KFSp_ThrowIf(stream->UpdateStream());
    bool found = false;
    int index = 0;
    KFSp_FirstError error;
    error.Keep(KFSp_SearchKeys(data, asked.time, &found, &index));
    if (found && asked.WantsSpeed()) {  // a float key has no speed of its own
        KFS_KeyScalar const* key = nullptr;
        error.Keep(KFSp_GetConstKey(data, index, &key));
        if (error.None()) found = (key->flags & KFS_KeyFlag_Float) == 0;
    }
    if (atKey) *atKey = found ? 1 : 0;
    if (!error.None() || !value) return error.Code();
    error.Keep(KFSp_ClearCacheRecord(stream, data->cache));
    if (!error.None() || stream->GetDimension() < 1) return error.Code();

    bool const isTangent = asked.tangentMode == KFS_Deriv_SpaceTangent;
    if (found)
        error.Keep(isTangent ? TangentOfKey(asked, index, value) : VelocityOfKey(asked, index, value));
    else if (!asked.keyOnly)
        error.Keep(isTangent ? TangentBetweenKeys(asked, data, index, value)
                             : VelocityBetweenKeys(asked, data, index, value));
    data->cache->time = KFS_INVALID_INDEX;  // the record never holds a rate after this
    return error.Code();
}

int Derive(Question const& asked, double* value, unsigned char* atKey, KFS_DerivSampleFilter const& sampleFilter,
           KFS_DerivFilter const& filter)
{
    bool const byExpression =
        (asked.flags & KFS_EvalFlag_NoExpression) == 0 && asked.seen->HasActiveExpression() && !asked.seen->IsCustom();
    if (byExpression) return DeriveExpression(asked, value, sampleFilter, filter);
    return DeriveKeys(asked, value, atKey);
}

// ---- directions

bool IsBefore(T_Time const& a, T_Time const& b)
{
    int order = 0;
    return T_CompareTime(&a, &b, &order) == 0 && order < 0;
}

// The times between which followers have keys.
class Extent {
public:
    void Add(KFS_Stream const* stream)
    {
        T_Time first{}, last{};
        if (KFSp_Seen(stream)->HasNoKeys() || KFS_IndexToTime(stream, 0, &first) != 0 ||
            KFS_IndexToTime(stream, -1, &last) != 0)
            return;
        if (!first_ || IsBefore(first, *first_)) first_ = first;
        if (!last_ || IsBefore(*last_, last)) last_ = last;
    }
    T_Time Clamp(T_Time time) const
    {
        if (first_ && IsBefore(time, *first_)) return *first_;
        return last_ && IsBefore(*last_, time) ? *last_ : time;
    }

private:
    std::optional<T_Time> first_, last_;
};

int TangentOfFollowers(Question const& asked, double* value, unsigned char* atKey)
{
    KFS_Stream const* const stream = asked.stream;
    T_Time const time{asked.time, asked.seen->GetTimeScale()};
    Extent extent;
    bool moves = false;
    for (int d = 0; d < stream->GetEffectiveDimension(); ++d) {
        if (value) value[d] = 0.0;
        KFS_Stream const* const follower = stream->GetSeparationFollower(d);
        if (!follower || follower->GetDimension() != 1) continue;  // a leaf of another kind stands there
        double rate = 0.0;
        unsigned char found = 0;
        if (int const code =
                KFS_GetDeriv(follower, &time, KFS_Deriv_Velocity, 0, asked.flags, &rate, &found, asked.bag, {}, {}))
            return code;
        if (value) value[d] = rate;
        if (atKey) *atKey |= found;
        extent.Add(follower);
        moves = moves || !(rate > -Still && rate < Still);
    }
    if (moves || !value) return 0;

    T_Time const centre = extent.Clamp(time);
    auto const vectorAt = [&](int offset) {
        int const at = static_cast<int>(static_cast<unsigned int>(centre.value) + static_cast<unsigned int>(offset));
        return stream->GetVector4Ex({{at, centre.scale}, asked.flags, asked.bag});
    };
    M_Vector4T<double> const before = vectorAt(-1);
    M_Vector4T<double> const after = vectorAt(1);
    for (int i = 0; i < 3; ++i) value[i] = after[i] - before[i];
    return 0;
}

bool IsUsable(KFS_Stream const* stream, double const* tangent)
{
    int const looked = std::min<int>(stream->GetDimension(), 3);
    return !KFSp_IsZero({tangent, static_cast<std::size_t>(std::max(looked, 0))});
}

// Looks from the time asked for, or from the key at an end, for the first value that differs, a unit of time a step.
int SearchMotion(Question const& asked, double* tangent)
{
    KFS_Stream const* const stream = asked.seen;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    auto const dimension = static_cast<std::size_t>(stream->GetDimension());
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (!error.None()) return error.Code();
        KFS_KeyScalar *at = nullptr, *earlier = nullptr, *later = nullptr;
        error.Keep(KFSp_GetNeighborsFromTime(stream, asked.time, 0, &at, &earlier, &later, nullptr, nullptr, nullptr));
        if (!error.None()) return error.Code();
        bool const isLast = !later, isFirst = !earlier;
        if (at && isLast) earlier = at;
        if (at && isFirst) later = at;

        auto const read = [&](int time, double* value) {
            T_Time const when{time, stream->GetTimeScale()};
            if (error.None()) error.Keep(KFS_GetValueFPlus(asked.stream, &when, 0, value, nullptr, asked.bag));
        };
        KFS_KeyScalar const* const end = earlier && later ? nullptr : earlier ? earlier : later;
        bool const backwards = end && end == earlier;
        int const from = end ? end->time : asked.time;
        std::vector<double> reference(dimension), trial(dimension);
        if (end)
            std::copy_n(KFSp_Numbers(end), dimension, reference.begin());
        else
            read(from, reference.data());
        trial = reference;
        for (int step = 1; step <= MostTrials; ++step) {
            auto const offset = static_cast<unsigned int>(backwards ? -step : step);
            read(static_cast<int>(static_cast<unsigned int>(from) + offset), trial.data());
            if (std::memcmp(trial.data(), reference.data(), dimension * sizeof(double)) != 0) break;
        }
        for (std::size_t i = 0; i < dimension; ++i)
            tangent[i] = backwards ? reference[i] - trial[i] : trial[i] - reference[i];
    }
    return error.Code();
}

int SpaceTangent(Question const& asked, double* value, unsigned char* atKey)
{
    KFS_Stream const* const stream = asked.stream;
    if (stream->AreDimensionsSeparated() && stream->GetParent()) return TangentOfFollowers(asked, value, atKey);
    unsigned char found = 0;
    int const code = Derive(asked, value, &found, {}, {});
    if (atKey) *atKey = found;
    if (code != 0 || !value || IsUsable(asked.seen, value)) return code;
    bool const canSearch = asked.seen->HasKeys() && asked.seen->GetKeyCount() > 0 && !asked.seen->HasActiveExpression();
    return canSearch ? SearchMotion(asked, value) : 0;
}

}  // namespace

int KFS_GetDeriv(KFS_Stream const* stream, T_Time const* time, char tangentMode, unsigned char keyOnly, int flags,
                 double* value, unsigned char* atKey, KFS_ParamBag const* bag, KFS_DerivSampleFilter sampleFilter,
                 KFS_DerivFilter filter)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetDeriv, stream, KFSp_Row_GetValue)) return code;
    return KFSp_Boundary([&] {
        Question asked{.stream = stream,
                       .seen = KFSp_Seen(stream, Q_RenderContext::PeekCurrent()),
                       .tangentMode = tangentMode,
                       .keyOnly = keyOnly != 0,
                       .flags = flags,
                       .bag = bag};
        if (int const code = KFSp_TimeInStream(asked.seen, time, &asked.time)) return code;
        return Derive(asked, value, atKey, sampleFilter, filter);
    });
}

int KFS_GetDerivs(KFS_Stream const* stream, T_Time const* start, T_Time const* step, char, int flags, double* value,
                  char*** values, KFS_ParamBag const* bag, KFS_DerivSampleFilter sampleFilter, KFS_DerivFilter filter)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetDerivs, stream, KFSp_Row_GetValue)) return code;
    KFS_Stream const* seen = stream;
    if (int const code = KFSp_Boundary([&] { seen = KFSp_Seen(stream); })) return code;
    if (seen->IsCustom() && !seen->IsSpatial())
        return KFSp_RefuseCustomInterpolation(KFSp_Op_GetDerivs, KFSp_Row_InquireDerivative);
    char** made = nullptr;
    if (!value) {
        if (!values)
            return Qp_ReportLegacyErrString(KFSp_ReportId(KFSp_Op_GetDerivs), KFSp_Severity, KFS_Err_LegacyMismatch,
                                            nullptr);
        auto const numbers = static_cast<std::size_t>(seen->IsSpatial() ? 1 : std::max<short>(seen->GetDimension(), 0));
        made = Q_AllocateHandleClear(KFSp_ReportId(KFSp_Op_GetDerivs), KFSp_MessageText(KFSp_Row_InterpolationArray),
                                     numbers * sizeof(double));
        if (!made) return KFS_Err_OutOfMemory;
        value = reinterpret_cast<double*>(*made);
    }
    T_Time at = start ? *start : T_Time{0, seen->GetTimeScale()};
    int code = KFS_GetDeriv(stream, &at, KFS_Deriv_Velocity, 0, flags, value, nullptr, bag, std::move(sampleFilter),
                            std::move(filter));
    if (code == 0) code = KFS_AddTime(step, &at, 0, &at);
    if (made && code == 0) *values = made;
    if (made && code != 0) Q_FreeHandle(made);
    return code;
}

int KFS_GetSpaceTangent(KFS_Stream const* stream, T_Time const* time, unsigned char keyOnly, int flags, double* value,
                        unsigned char* atKey, KFS_ParamBag const* bag)
{
    if (atKey) *atKey = 0;
    if (int const code = KFSp_CheckStream(KFSp_Op_GetSpaceTangent, stream, KFSp_Row_SpatialTangents)) return code;
    return KFSp_Boundary([&] {
        Question asked{.stream = stream,
                       .seen = KFSp_Seen(stream),
                       .tangentMode = KFS_Deriv_SpaceTangent,
                       .keyOnly = keyOnly != 0,
                       .flags = flags,
                       .bag = bag};
        if (int const code = KFSp_TimeInStream(asked.seen, time, &asked.time)) return code;
        if (!asked.seen->IsSpatial())
            return KFSp_ReportErr(KFSp_Op_GetSpaceTangent, KFS_Err_NotSpatial, KFSp_Row_SpatialTangents);
        return SpaceTangent(asked, value, atKey);
    });
}
