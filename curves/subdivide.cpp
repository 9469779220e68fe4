// Splits the curve at a key that joins it, or that stops floating, so that it keeps its shape.
#include "curves/subdivide_private.h"

#include "curves/arcs_private.h"
#include "curves/autotangents_private.h"
#include "curves/interpolate_private.h"
#include "curves/neighbours_private.h"
#include "curves/segment_private.h"
#include "curves/spatial_private.h"
#include "frame/report_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <array>
#include <climits>

namespace {

// A split: the new key between its anchors, either of which may be missing.
struct Split {
    KFS_Stream* stream;
    KFS_StreamKeyData* data;
    int time;
    char mode;
    KFS_KeyScalar* key;
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    int prevIndex = 0;
    int nextIndex = 0;

    int Dimension() const { return stream->GetDimension(); }
    bool Between() const { return prev && next; }
    bool IsNewKey() const { return key == data->cache; }
    bool Wants(char tangents) const { return (mode & tangents) != 0; }
    bool PrevIsLinear() const { return prev && prev->outInterp == KFS_Interp_Linear; }
    bool NextIsLinear() const { return next && next->inInterp == KFS_Interp_Linear; }
    bool IsHeld() const
    {
        return Between() && (prev->outInterp == KFS_Interp_Hold || next->inInterp == KFS_Interp_Hold);
    }
    bool NonDecreasing() const { return (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0; }
    double X() const { return prev ? KFSp_Seconds(time, prev->time, stream->GetTimeScale()) : 0.0; }
    double Duration() const { return Between() ? KFSp_Seconds(next->time, prev->time, stream->GetTimeScale()) : 0.0; }
};

// Zeroes a spatial key's tangents.
void FlattenTangents(KFS_KeyScalar* key, int dimension)
{
    KFSp_SpatialRuns<double> const runs = KFSp_GetSpatialRuns(key, dimension);
    std::fill_n(runs.inTangent, dimension, 0.0);
    std::fill_n(runs.outTangent, dimension, 0.0);
}

// What a new key has where nothing else gives it handles: the record is scratch, and holds numbers of whatever was read
// last.
void RestHandles(Split const& split)
{
    int const dimension = split.Dimension();
    KFS_KeyScalar* const key = split.key;
    if (split.stream->IsSpatial()) {
        key->arcLength = 0.0;
        key->inSpeed = key->outSpeed = 0.0;
        key->inInfluence = key->outInfluence = KFSp_OneSixth;
        FlattenTangents(key, dimension);
        return;
    }
    KFSp_TemporalRuns<double> const runs = KFSp_GetTemporalRuns(key, dimension);
    std::fill_n(runs.inSpeed, dimension, 0.0);
    std::fill_n(runs.outSpeed, dimension, 0.0);
    std::fill_n(runs.inInfluence, dimension, KFSp_OneSixth);
    std::fill_n(runs.outInfluence, dimension, KFSp_OneSixth);
}

// The value that the stream has at the time, for a new key: interpolation writes the cache record, which is the key.
int TakeValue(Split const& split)
{
    KFS_KeyScalar const* held = split.prev ? split.prev : split.next;
    if (!split.stream->IsSpatial() && split.IsHeld() && split.prev->outInterp != KFS_Interp_Hold) held = split.next;
    double* const value = KFSp_Numbers(split.key);
    if (held)
        std::copy_n(KFSp_Numbers(held), split.Dimension(), value);
    else
        std::fill_n(value, split.Dimension(), 0.0);
    if (!split.Between()) return 0;
    if (!split.stream->IsSpatial()) return KFSp_Interpolate(split.stream, 0, split.time, split.prevIndex);
    int const code = KFSp_InterpolateSpatial(split.stream, 0, split.time, -1);
    FlattenTangents(split.key, split.Dimension());  // one of them took the path's parameter
    return code;
}

// The arcs from anchor to anchor, of which the split has changed some.
int MarkArcs(Split const& split)
{
    int const count = split.nextIndex - split.prevIndex;
    return split.stream->SetArcInvalid(split.nextIndex, static_cast<short>(std::min(count, SHRT_MAX)));
}

// The path's half works on the keys right beside the new one, float keys or not, since the path runs through all of
// them. Their facing tangents become absolute handles in place, so that the curve lies on the keys' own numbers.
int SplitPath(Split const& split)
{
    KFSp_PathPoint point;
    if (int const code = KFSp_FindOnPath(split.stream, split.time, &point); code != 0) return code;
    KFSp_Neighbours beside;
    if (int const code = KFSp_FindAround(split.stream, split.time, 1, &beside); code != 0) return code;
    // Float keys that crowd, or that a hold passes over, have other times than the point that comes by. The piece between
    // the keys beside isn't where the stream is then: the new key takes the place, and the path bends.
    if (point.first != beside.prev || point.second != beside.next) return split.IsNewKey() ? TakeValue(split) : 0;

    int const dimension = split.Dimension();
    KFSp_SpatialRuns<double> const prev = KFSp_GetSpatialRuns(beside.prev, dimension);
    KFSp_SpatialRuns<double> const next = KFSp_GetSpatialRuns(beside.next, dimension);
    KFSp_SpatialRuns<double> const key = KFSp_GetSpatialRuns(split.key, dimension);
    for (int i = 0; i < dimension; ++i) {
        prev.outTangent[i] += prev.value[i];
        next.inTangent[i] += next.value[i];
    }
    CRV_Curve const curve{static_cast<short>(dimension), prev.value, prev.outTangent, next.inTangent, next.value};
    std::array<double, 5 * KFSp_SegmentCurve::MaxDimension> rows{};
    if (int const code = CRV_SubdivideCurve(&curve, rows.data(), point.t); code != 0) return code;
    auto const row = [&](int index, int i) { return rows[static_cast<std::size_t>(index * dimension + i)]; };
    for (int i = 0; i < dimension; ++i) {
        prev.outTangent[i] = row(0, i) - prev.value[i];
        next.inTangent[i] = row(4, i) - next.value[i];
        key.value[i] = row(2, i);
        key.inTangent[i] = row(1, i) - key.value[i];
        key.outTangent[i] = row(3, i) - key.value[i];
    }

    split.key->flags |= KFS_KeyFlag_TangentsSet;
    for (KFS_KeyScalar* const changed : {split.key, beside.prev, beside.next})
        changed->spFlags &= ~KFS_KeySpFlag_Modifiable;
    // On a straight run the path stays made of keys without tangents.
    auto const size = static_cast<std::size_t>(dimension);
    if (KFSp_IsZero({prev.inTangent, size}) && KFSp_IsZero({next.outTangent, size}))
        FlattenTangents(split.key, dimension);
    return MarkArcs(split);
}

// A spatial key's speed graph as the five runs of a plain key of dimension 1, distance standing in for the value.
using SpeedNumbers = std::array<double, 5>;

SpeedNumbers GetSpeedNumbers(KFS_KeyScalar const* key)
{
    return {key->arcLength, key->inSpeed, key->inInfluence, key->outSpeed, key->outInfluence};
}

void SetSpeedNumbers(KFS_KeyScalar* key, SpeedNumbers const& numbers)
{
    key->arcLength = numbers[0];
    key->inSpeed = numbers[1];
    key->inInfluence = numbers[2];
    key->outSpeed = numbers[3];
    key->outInfluence = numbers[4];
}

void ClearModifiable(Split const& split)
{
    for (KFS_KeyScalar* const changed : {split.key, split.prev, split.next})
        if (changed) changed->flags &= static_cast<unsigned short>(~KFS_KeyFlag_Modifiable);
}

int SplitSpeedGraph(Split const& split)
{
    double total = 0.0;
    if (int const code = KFSp_SumArcs(split.data, split.prevIndex, split.nextIndex, &total); code != 0) return code;
    double const prevArc = split.prev->arcLength;
    double const nextArc = split.next->arcLength;
    split.prev->arcLength = 0.0;
    split.next->arcLength = total;

    SpeedNumbers prev = GetSpeedNumbers(split.prev);
    SpeedNumbers next = GetSpeedNumbers(split.next);
    SpeedNumbers key = GetSpeedNumbers(split.key);
    int const code =
        KFSp_ComputeTempSubdivision(1, split.X(), split.Duration(), split.NonDecreasing() ? 1 : 0, split.PrevIsLinear(),
                                    split.NextIsLinear(), prev.data(), next.data(), key.data());
    SetSpeedNumbers(split.prev, prev);
    SetSpeedNumbers(split.next, next);
    SetSpeedNumbers(split.key, key);
    if (code != 0) return code;
    split.prev->arcLength = prevArc;
    split.next->arcLength = nextArc;
    ClearModifiable(split);
    return 0;
}

int SplitSpatial(Split const& split)
{
    bool const splitsPath = split.Wants(KFSp_Tangents_Spatial) && split.Between();
    int code = 0;
    if (splitsPath)
        code = SplitPath(split);
    else if (split.IsNewKey())
        code = TakeValue(split);
    if (code != 0 || !split.Wants(KFSp_Tangents_Temporal) || !split.Between()) return code;
    return SplitSpeedGraph(split);
}

int SplitHandles(Split const& split)
{
    bool const prevLinear = split.PrevIsLinear();
    bool const nextLinear = split.NextIsLinear();
    int const code = KFSp_ComputeTempSubdivision(
        split.stream->GetDimension(), split.X(), split.Duration(), split.NonDecreasing() ? 1 : 0, prevLinear,
        nextLinear, split.prev ? KFSp_Numbers(split.prev) : nullptr, split.next ? KFSp_Numbers(split.next) : nullptr,
        KFSp_Numbers(split.key));
    ClearModifiable(split);
    // The handles carry the line now.
    if (prevLinear) split.prev->outInterp = KFS_Interp_Spline;
    if (nextLinear) split.next->inInterp = KFS_Interp_Spline;
    return code;
}

int SplitPlain(Split const& split)
{
    int code = 0;
    if (split.Wants(KFSp_Tangents_Temporal)) code = SplitHandles(split);
    // The split of a held segment is that of a curve which nobody sees.
    bool const takesValue = !split.Wants(KFSp_Tangents_Temporal) || split.IsHeld();
    return code == 0 && split.IsNewKey() && takesValue ? TakeValue(split) : code;
}

int Run(Split* split)
{
    KFSp_Neighbours anchors;
    if (int const code = KFSp_FindAround(split->stream, split->time, 0, &anchors); code != 0) return code;
    split->prev = anchors.prev;
    split->next = anchors.next;
    split->prevIndex = anchors.prevIndex;
    split->nextIndex = anchors.nextIndex;
    if (split->IsNewKey()) RestHandles(*split);
    return split->stream->IsSpatial() ? SplitSpatial(*split) : SplitPlain(*split);
}

// Only the speed graph of a custom stream has numbers that could be split.
bool NeedsPlainValue(Split const& split)
{
    return split.IsNewKey() || !split.stream->IsSpatial() || split.Wants(KFSp_Tangents_Spatial);
}

}  // namespace

int KFSp_SubdivideSpline(KFS_Stream* stream, int time, char mode, KFS_KeyScalar* key)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_Subdivide, stream, KFSp_Row_InquireKey); code != 0) return code;
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    if (stream->HasNoKeys() || KFSp_ItemCount(data) == 0)
        return KFSp_ReportErr(KFSp_Op_Subdivide, KFS_Err_NoKeys, KFSp_Row_Subdivide);
    Split split{stream, data, time, mode, key};
    if ((stream->IsCustom() || stream->IsTemporarilyNonCustom()) && NeedsPlainValue(split))
        return KFSp_RefuseCustomValue(KFSp_Op_Subdivide, KFSp_Row_ConvertTo);
    if (int const code = stream->UpdateStream(); code != 0) return code;
    if (!split.IsNewKey()) split.time = key->time;
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(data->keys, error);
        if (error.None()) error.Keep(Run(&split));
    }
    return error.Code();
}
