// The render identity of a leaf: its value over the span, or the keys that shape it there. What can't change the span
// stays out, since every needless change throws a rendered frame away.

#include "curves/keyhandles_private.h"
#include "curves/neighbours_private.h"
#include "curves/spacetangents.h"
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
#include <cstring>
#include <utility>

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
    KFS_StreamKeyData const* data;  // the source's
    T_TimeSpan span;                // on the source's time line
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

// Gathers the many small numbers that describe a key, so that the hash is fed seldom: how its bytes are cut makes no
// difference to it. Fed before a stream mixes in its value, and in the end.
class Gathered {
public:
    explicit Gathered(KFSp_IdentityHash& hash) : hash_(hash) {}

    KFSp_IdentityHash& Fed()
    {
        hash_.Mix(bytes_.data(), size_);
        size_ = 0;
        return hash_;
    }
    template <class Number>
    void Put(Number number)
    {
        if (bytes_.size() - size_ < sizeof number) Fed();
        std::memcpy(bytes_.data() + size_, &number, sizeof number);
        size_ += sizeof number;
    }
    void Put(T_Time const& time)
    {
        Put(time.value);
        Put(time.scale);
    }

private:
    KFSp_IdentityHash& hash_;
    std::size_t size_ = 0;
    std::array<unsigned char, 512> bytes_;
};

unsigned int GreatestDivisor(unsigned int a, unsigned int b)
{
    while (b != 0) a = std::exchange(b, a % b);
    return a;
}

// From one time to another, in lowest terms. Most keys have the scale of what is rendered.
T_Time Distance(T_Time const& from, T_Time const& to)
{
    std::int64_t const units = std::int64_t{to.value} - from.value;
    auto const size = static_cast<std::uint64_t>(units < 0 ? -units : units);
    if (from.scale == to.scale && from.scale != 0 && size <= INT_MAX) {
        unsigned int const divisor = GreatestDivisor(static_cast<unsigned int>(size), from.scale);
        int const value = static_cast<int>(static_cast<unsigned int>(size) / divisor);
        return {units < 0 ? -value : value, from.scale / divisor};
    }
    T_Time const distance = to - from;
    T_Time reduced{};
    KFSp_ThrowIf(T_ReduceTime(&distance, &reduced, nullptr));
    return reduced;
}

// The keys at an index and behind it.
KFSp_KeyPair KeyPair(Asked const& asked, int index)
{
    KFSp_KeyPair const pair = KFSp_GetKeyPair(asked.data, index);
    if (!pair.a) throw int{SEQ_Err_BadIndex};
    return pair;
}

// How far the key's neighbours are, where a list has no float keys to pass over: in place of KFSp_GetDurations.
KFSp_Durations DurationsInList(Asked const& asked, Key const& key)
{
    KFSp_Durations durations;
    unsigned int const scale = asked.data->stream->GetTimeScale();
    durations.hasPrev = key.index > 0;
    durations.hasNext = key.index + 1 < KFSp_ItemCount(asked.data);
    if (durations.hasPrev)
        durations.prev = KFSp_Seconds(key.record->time, KeyPair(asked, key.index - 1).a->time, scale);
    if (durations.hasNext) durations.next = KFSp_Seconds(KeyPair(asked, key.index).b->time, key.record->time, scale);
    return durations;
}

// One side of a key: how it is left or reached, and the handles that go with it.
void PutSide(Gathered& gathered, Asked const& asked, Key const& key, KFSp_Side side, KFSp_Durations const& durations)
{
    KFS_Stream const* const seen = asked.data->stream;
    bool const spatial = HasSpaceTangents(seen);
    int const dimension = std::max<short>(seen->GetDimension(), 0);
    char const interp = side == KFSp_Side::In ? key.record->inInterp : key.record->outInterp;
    gathered.Put(interp);
    if (interp == KFS_Interp_Spline) {
        KFSp_SideTangent const tangent(seen, key.record, side, durations);
        int const count = spatial ? 1 : dimension;
        for (int i = 0; i < count; ++i) gathered.Put(tangent.X(i));
        for (int i = 0; i < count; ++i) gathered.Put(tangent.Y(i));
    }
    if (!spatial) return;
    SpaceTangents const tangents(asked.source, key.index);
    Numbers const& tangent = side == KFSp_Side::In ? tangents.in : tangents.out;
    if (!IsLive(tangent)) return;
    for (int i = 0; i < dimension; ++i) gathered.Put(tangent[static_cast<std::size_t>(i)]);
}

// The keys from `first` to `last` that are mixed in, and when the span is over.
struct Range {
    int first;
    int last;
    T_Time end;
};

// A key's value, the sides that face the range, and its place in the span unless it is alone. With `valueOnly` it is a
// neighbour of the range. The stream is up to date, so records are looked at without asking for that key by key.
void MixInKey(Gathered& gathered, Asked const& asked, int index, Range const& range, bool valueOnly)
{
    Key key{index, nullptr};
    KFSp_ThrowIf(KFSp_GetConstKey(asked.data, index, &key.record));
    T_Time const time{key.record->time, asked.data->stream->GetTimeScale()};
    asked.stream->MixInValueAtTime(gathered.Fed(), time, asked.bag);
    if (range.first == range.last) return;
    if (!valueOnly) {
        KFSp_Durations durations;
        if (asked.data->stream->IsSpatial())
            KFSp_ThrowIf(KFSp_GetDurations(asked.data->stream, index, key.record, &durations));
        else
            durations = DurationsInList(asked, key);
        if (index != range.first) PutSide(gathered, asked, key, KFSp_Side::In, durations);
        if (index != range.last) PutSide(gathered, asked, key, KFSp_Side::Out, durations);
    }
    gathered.Put(Distance(asked.span.start, time));
    gathered.Put(Distance(time, range.end));
}

// Whether the key's handles follow from its neighbours.
bool IsModifiable(KFS_Stream const* stream, Key const& key)
{
    if ((key.record->flags & KFS_KeyFlag_Modifiable) != 0) return true;
    if (!HasSpaceTangents(KFSp_Seen(stream)) || (key.record->spFlags & KFS_KeySpFlag_Modifiable) == 0) return false;
    SpaceTangents const tangents(stream, key.index);
    return IsLive(tangents.in) || IsLive(tangents.out);
}

// A time as the source counts it.
int UnitsOf(Asked const& asked, T_Time const& time)
{
    int units = 0;
    KFSp_ThrowIf(T_ShortConvTime(time.value, time.scale, asked.data->stream->GetTimeScale(), &units));
    return units;
}

// The key at a time of the source; without one the key on the preferred side, else the one on the other.
Key FindKey(Asked const& asked, int units, bool before)
{
    KFSp_Neighbours around;
    KFSp_ThrowIf(KFSp_FindAround(asked.source, units, 0, &around));
    if (around.at) return {around.atIndex, around.at};
    Key const prev{around.prevIndex, around.prev};
    Key const next{around.nextIndex, around.next};
    Key const& preferred = before ? prev : next;
    return preferred.record ? preferred : before ? next : prev;
}

// The key that ends a span which begins at `first`. Most spans are short, so that a few steps are less than a search.
Key FindEnd(Asked const& asked, Key const& first, int start, int end)
{
    constexpr int MostSteps = 8;
    if (asked.data->stream->IsSpatial() || end < start) return FindKey(asked, end, false);
    int const last = KFSp_ItemCount(asked.data) - 1;
    Key key = first;
    for (int step = 0; step < MostSteps; ++step) {
        if (key.record->time >= end || key.index == last) return key;
        key = {key.index + 1, KeyPair(asked, key.index).b};
    }
    return FindKey(asked, end, false);
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
    int const start = UnitsOf(asked, asked.span.start);
    Key const first = FindKey(asked, start, true);
    T_Time const end = asked.span.start + asked.span.duration;
    Key const last = FindEnd(asked, first, start, UnitsOf(asked, end));
    Range range{first.index, last.index, end};
    if (last.index == first.index + 1 && IsFlat(asked, first, last)) range.last = first.index;
    Gathered gathered(hash);
    for (int index = range.first; index <= range.last; ++index) MixInKey(gathered, asked, index, range, false);
    if (range.first < range.last) {
        // An automatic handle follows the neighbour beyond.
        if (first.index > 0 && IsModifiable(asked.source, first))
            MixInKey(gathered, asked, first.index - 1, range, true);
        if (last.index + 1 < KFSp_ItemCount(asked.data) && IsModifiable(asked.source, last))
            MixInKey(gathered, asked, last.index + 1, range, true);
    }
    gathered.Fed();
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
    Asked asked{this, this, nullptr, span, options.GetParamBag(), filter != nullptr};
    KFS_StreamOverride const* streamOverride = nullptr;
    if (asked.bag->GetStreamOverride(this, &streamOverride))
        static_cast<void>(streamOverride->GetValueGetterStream(&asked.source, &asked.span));

    KFS_StreamKeyData const* const data = asked.source->GetKeyData();
    asked.data = data;
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
    if (count <= VectorSize) return;
    KFS_Stream const* const seen = KFSp_Seen(this);
    if (seen->IsCustom()) return;
    // What a vector has no room for changes the picture all the same.
    Numbers values(static_cast<std::size_t>(std::max<int>(count, seen->GetDimension())), 0.0);
    KFSp_ThrowIf(KFS_GetValueFPlus(this, &time, 0, values.data(), nullptr, bag));
    hash.Mix(values.data() + VectorSize, sizeof(double) * static_cast<std::size_t>(count - VectorSize));
}
