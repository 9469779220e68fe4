// The render identity of a leaf: its value over the span, or the keys that shape it there. What can't change the span
// stays out, since every needless change throws a rendered frame away.

#include "curves/neighbours_private.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "frame/boundary_private.h"
#include "frame/services/reports.h"
#include "identity/mixin_private.h"
#include "identity/renderoptions.h"
#include "keystore/evaluate.h"
#include "keystore/keylist_private.h"
#include "keystore/lookup.h"
#include "keystore/pins_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"
#include "overrides/parambag.h"
#include "overrides/streamexpression.h"

#include <boost/container/small_vector.hpp>

#include <algorithm>
#include <array>
#include <climits>
#include <cmath>

using hearth::utility::Guid;

namespace {

// Handles shorter than this in every component count as none.
constexpr double HandleEpsilon = 1e-12;
// Seconds, and so samples, of an expression that says nothing itself.
constexpr double MinSamples = 4;
constexpr double MaxSamples = 128;

constexpr int ReportId = 0x1d0000;
constexpr int ReportSeverity = 8;

// The least spatial interpolation mask with which a path bends.
constexpr unsigned short BezierPathMask = 4;

using Numbers = boost::container::small_vector<double, 4>;

// The leaf that is asked, and the one whose keys shape it: another one where an override takes the value from there.
struct Asked {
    KFS_Stream const* stream;
    KFS_Stream const* source;
    T_TimeSpan span;  // on the source's time line
    KFS_ParamBag const* bag;
    bool filtered;
};

struct Key {
    int index = KFS_INVALID_INDEX;
    KFS_KeyScalar const* record = nullptr;
};

// Plain keys with tangents in space. What counts is the stream as this thread sees it.
bool HasSpaceTangents(KFS_Stream const* seen)
{
    return !KFSp_HasCustomRecords(seen) && seen->IsSpatial() && seen->GetSpInterpMask() >= BezierPathMask;
}

struct SpaceTangents {
    Numbers in;
    Numbers out;

    SpaceTangents(KFS_Stream const* stream, int index)
        : in(std::max<std::size_t>(4, KFSp_Seen(stream)->GetDimension()), 0.0),
          out(in)
    {
        KFSp_ThrowIf(KFS_GetKeySpaceTangentsF(stream, index, -1, in.data(), out.data()));
    }
};

// Whether any of the first four numbers is more than nothing; a NaN is.
bool IsLive(Numbers const& tangent)
{
    return !std::all_of(
        tangent.begin(), tangent.begin() + 4,
        [](double number) { return number > -HandleEpsilon && number < HandleEpsilon; });
}

void MixInNumbers(KFSp_IdentityHash& hash, Numbers const& numbers, std::size_t count)
{
    hash.Mix(numbers.data(), count * sizeof(double));
}

void MixInReduced(KFSp_IdentityHash& hash, T_Time const& time)
{
    T_Time reduced{};
    KFSp_ThrowIf(T_ReduceTime(&time, &reduced, nullptr));
    hash.MixNumber(reduced.value);
    hash.MixNumber(reduced.scale);
}

// One side of a key: how it is left or reached, and the handles that go with it.
void MixInSide(KFSp_IdentityHash& hash, KFS_Stream const* stream, int index, bool in)
{
    KFS_Stream const* const seen = KFSp_Seen(stream);
    bool const spatial = HasSpaceTangents(seen);
    std::size_t const dimension = static_cast<std::size_t>(std::max<short>(seen->GetDimension(), 0));
    std::size_t const handles = spatial ? 1 : dimension;

    char inInterp = KFS_Interp_None;
    char outInterp = KFS_Interp_None;
    KFSp_ThrowIf(KFS_GetKeyF(stream, index, nullptr, &inInterp, &outInterp));
    char const interp = in ? inInterp : outInterp;
    hash.MixNumber(interp);
    if (interp == KFS_Interp_Spline) {
        Numbers x(dimension, 0.0);
        Numbers y(dimension, 0.0);
        KFSp_ThrowIf(in ? KFS_GetKeyTangentsF(stream, index, x.data(), y.data(), nullptr, nullptr)
                        : KFS_GetKeyTangentsF(stream, index, nullptr, nullptr, x.data(), y.data()));
        MixInNumbers(hash, x, handles);
        MixInNumbers(hash, y, handles);
    }
    if (!spatial) return;
    SpaceTangents const tangents(stream, index);
    Numbers const& tangent = in ? tangents.in : tangents.out;
    if (IsLive(tangent)) MixInNumbers(hash, tangent, dimension);
}

// The keys from `first` to `last` that are mixed in.
struct Range {
    int first;
    int last;
};

// A key's value, the sides that face the range, and its place in the span unless it is alone. With `valueOnly` it is a
// neighbour of the range.
void MixInKey(KFSp_IdentityHash& hash, Asked const& asked, int index, Range const& range, bool valueOnly)
{
    T_Time time{};
    KFSp_ThrowIf(KFS_IndexToTime(asked.source, index, &time));
    asked.stream->MixInValueAtTime(hash, time, asked.bag);
    if (!valueOnly) {
        if (index != range.first) MixInSide(hash, asked.source, index, true);
        if (index != range.last) MixInSide(hash, asked.source, index, false);
    }
    if (range.first == range.last) return;
    MixInReduced(hash, time - asked.span.start);
    MixInReduced(hash, asked.span.start + asked.span.duration - time);
}

// Whether the key's handles follow from its neighbours.
bool IsModifiable(KFS_Stream const* stream, Key const& key)
{
    if ((key.record->flags & KFS_KeyFlag_Modifiable) != 0) return true;
    if (!HasSpaceTangents(KFSp_Seen(stream)) || (key.record->spFlags & KFS_KeySpFlag_Modifiable) == 0) return false;
    SpaceTangents const tangents(stream, key.index);
    return IsLive(tangents.in) || IsLive(tangents.out);
}

// The key at a time of the source; without one the key on the preferred side, else the one on the other.
Key FindKey(KFS_Stream const* source, T_Time const& time, bool before)
{
    int units = 0;
    KFSp_ThrowIf(T_ShortConvTime(time.value, time.scale, KFSp_Seen(source)->GetTimeScale(), &units));
    KFSp_Neighbours around;
    KFSp_ThrowIf(KFSp_FindAround(source, units, 0, &around));
    if (around.at) return {around.atIndex, around.at};
    Key const prev{around.prevIndex, around.prev};
    Key const next{around.nextIndex, around.next};
    Key const& preferred = before ? prev : next;
    return preferred.record ? preferred : before ? next : prev;
}

bool AllZero(double const* numbers, int count)
{
    return std::all_of(
        numbers, numbers + count, [](double number) { return number == 0.0; });
}

// Whether nothing moves between two keys side by side, so that a span between them may lie anywhere there.
bool IsFlat(Asked const& asked, Key const& first, Key const& last)
{
    KFS_Stream const* const seen = KFSp_Seen(asked.source);
    unsigned int const scale = seen->GetTimeScale();
    T_Time const firstTime{first.record->time, scale};
    T_Time const lastTime{last.record->time, scale};
    if (first.record->outInterp == KFS_Interp_Hold && !asked.span.Contains(lastTime)) return true;
    if (seen->IsSpatial()) {
        if (IsLive(SpaceTangents(asked.source, first.index).out) || IsLive(SpaceTangents(asked.source, last.index).in))
            return false;
    } else {
        int const dimension = seen->GetDimension();
        bool const plain = !KFSp_HasCustomRecords(seen);
        auto const flatSide = [&](char interp, double const* speed) {
            return interp == KFS_Interp_Linear || (interp == KFS_Interp_Spline && plain && AllZero(speed, dimension));
        };
        if (!flatSide(first.record->outInterp, KFSp_GetTemporalRuns(first.record, dimension).outSpeed) ||
            !flatSide(last.record->inInterp, KFSp_GetTemporalRuns(last.record, dimension).inSpeed))
            return false;
    }
    return asked.source->SameValueAtTimes(firstTime, lastTime, asked.bag);
}

// Cost doesn't grow with the number of keys: those around the span are all that is looked at.
void MixInKeys(KFSp_IdentityHash& hash, Asked const& asked)
{
    KFSp_ThrowIf(
        asked.source->UpdateStream());  // float keys move, and handles change, when they are brought up to date
    Key const first = FindKey(asked.source, asked.span.start, true);
    Key const last = FindKey(asked.source, asked.span.start + asked.span.duration, false);
    Range range{first.index, last.index};
    if (last.index == first.index + 1 && IsFlat(asked, first, last)) range.last = first.index;
    for (int index = range.first; index <= range.last; ++index) MixInKey(hash, asked, index, range, false);
    if (range.first >= range.last) return;

    // An automatic handle follows the neighbour beyond.
    if (first.index > 0 && IsModifiable(asked.source, first)) MixInKey(hash, asked, first.index - 1, range, true);
    if (last.index + 1 < KFSp_ItemCount(asked.source->GetKeyData()) && IsModifiable(asked.source, last))
        MixInKey(hash, asked, last.index + 1, range, true);
}

// What the author of an expression asks for, as a number of samples a second.
bool FindSamplesPerSecond(u16str const& expression, int* perSecond)
{
    constexpr std::string_view Name = "cacheCompareSamplesPerSecond";
    constexpr std::size_t LongestNumber = 20;
    std::string const text = Q_UTF16ToMBString(expression);
    std::size_t const place = text.find(Name);
    if (place == std::string::npos) return false;
    u16str const number = Q_MBToUTF16String(text.substr(place + Name.size(), LongestNumber));
    return hearth::string::StringToNumber(number, perSecond, hearth::string::NumberFlag_SkipAssignment);
}

// A negative number is the author's mistake, and ends the expression.
void RefuseSamplesPerSecond(KFS_Stream const* stream)
{
    u16str const text = Q_ZStringToUTF16String("$$$/VX/Expression/InvalidCacheCompareSamplesPerSecond="
                                               "cacheCompareSamplesPerSecond must be at least 0. Expression Disabled.");
    Q_ReportError(ReportId, ReportSeverity, text);
    KFS_SetStreamExprErrorMessage(const_cast<KFS_Stream*>(stream), text, -1, u16str());
}

int CountSamples(Asked const& asked)
{
    T_Time const& duration = asked.span.duration;
    double const seconds = static_cast<double>(duration.value) / static_cast<double>(duration.scale);
    double count = duration.value == 0 ? 1 : std::clamp(std::ceil(seconds), MinSamples, MaxSamples);
    int perSecond = 0;
    if (FindSamplesPerSecond(KFSp_Seen(asked.stream)->GetExpression(), &perSecond)) {
        if (perSecond < 0) {
            RefuseSamplesPerSecond(asked.stream);
            return 1;
        }
        count = std::max(MinSamples, std::ceil(seconds * perSecond));
    }
    return static_cast<int>(std::min(count, static_cast<double>(INT_MAX)));
}

// An expression can depend on anything at any time, so its value is sampled. Whoever filters looks at one moment.
void MixInSamples(KFSp_IdentityHash& hash, Asked const& asked)
{
    int const count = asked.filtered ? 1 : CountSamples(asked);
    T_Time time = asked.span.start;
    T_Time const step = asked.span.duration / count;
    for (int i = 0; i < count; ++i) {
        if (i > 0) time += step;
        asked.stream->MixInValueAtTime(hash, time, asked.bag);
    }
}

}  // namespace

Guid KFS_Stream::GetRenderGuid(KFS_RenderOptionsBase const& options, GetRenderGuidFilter* filter) const
{
    KFSp_IdentityHash hash;
    KFSp_MixInMatchName(hash, GetMatchName());
    T_TimeSpan const span = T_NormalizeSpan({*options.GetTimeSpanStart(), *options.GetTimeSpanDuration()});
    Asked asked{this, this, span, options.GetParamBag(), filter != nullptr};
    KFS_StreamOverride const* streamOverride = nullptr;
    if (asked.bag->GetStreamOverride(this, &streamOverride))
        static_cast<void>(streamOverride->GetValueGetterStream(&asked.source, &asked.span));

    KFS_StreamKeyData const* const data = asked.source->GetKeyData();
    if (data->stream->HasActiveExpression()) {
        MixInSamples(hash, asked);
    } else if (data->stream->HasNoKeys() || KFSp_ItemCount(data) < 2) {
        MixInValueAtTime(hash, asked.span.start, asked.bag);
    } else {
        KFSp_FirstError error;
        {
            KFSp_ScConstPin const pin(data->keys, error);
            if (error.None()) MixInKeys(hash, asked);
        }
        KFSp_ThrowIf(error.Code());
    }
    return hash.GetGuid();
}

void KFS_Stream::MixInValueAtTime(KFSp_IdentityHash& hash, T_Time const& time) const
{
    MixInValueAtTime(hash, time, nullptr);
}

void KFS_Stream::MixInValueAtTime(KFSp_IdentityHash& hash, T_Time const& time, KFS_ParamBag const* bag) const
{
    switch (GetParamDef().paramType) {
    case FX_Param_GROUP:
    case 13:
    case 14:
    case FX_Param_LABEL: return;  // kinds without a value
    default: break;
    }
    constexpr int VectorSize = 4;
    int const count = GetEffectiveDimension();
    M_Vector4T<double> const vector = GetVector4Ex(KFS_EvalData{time, 0, bag});
    hash.Mix(vector.v, sizeof(double) * static_cast<std::size_t>(std::clamp(count, 0, VectorSize)));
    KFS_Stream const* const seen = KFSp_Seen(this);
    if (count <= VectorSize || seen->IsCustom()) return;
    // What a vector has no room for changes the picture all the same.
    Numbers values(static_cast<std::size_t>(std::max<int>(count, seen->GetDimension())), 0.0);
    KFSp_ThrowIf(KFS_GetValueFPlus(this, &time, 0, values.data(), nullptr, bag));
    hash.Mix(values.data() + VectorSize, sizeof(double) * static_cast<std::size_t>(count - VectorSize));
}
