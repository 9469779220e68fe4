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

namespace {

// A split: the new key between its anchors, either of which may be missing.
struct Place {
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
void RestHandles(Place const& place)
{
    int const dimension = place.Dimension();
    KFS_KeyScalar* const key = place.key;
    if (place.stream->IsSpatial()) {
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
int TakeValue(Place const& place)
{
    KFS_KeyScalar const* held = place.prev ? place.prev : place.next;
    if (!place.stream->IsSpatial() && place.IsHeld() && place.prev->outInterp != KFS_Interp_Hold) held = place.next;
    double* const value = KFSp_Numbers(place.key);
    if (held)
        std::copy_n(KFSp_Numbers(held), place.Dimension(), value);
    else
        std::fill_n(value, place.Dimension(), 0.0);
    if (!place.Between()) return 0;
    if (!place.stream->IsSpatial()) return KFSp_Interpolate(place.stream, 0, place.time, place.prevIndex);
    int const code = KFSp_InterpolateSpatial(place.stream, 0, place.time, -1);
    FlattenTangents(place.key, place.Dimension());  // one of them took the path's parameter
    return code;
}

// The path's half. The neighbours' facing tangents become absolute handles in place, so that the curve lies on the
// keys' own numbers.
int SplitPath(Place const& place)
{
    if (int const code = KFSp_InterpolateSpatial(place.stream, 0, place.time, -1); code != 0) return code;
    int const dimension = place.Dimension();
    double const t = KFSp_Numbers(place.data->cache)[dimension];

    KFSp_SpatialRuns<double> const prev = KFSp_GetSpatialRuns(place.prev, dimension);
    KFSp_SpatialRuns<double> const next = KFSp_GetSpatialRuns(place.next, dimension);
    KFSp_SpatialRuns<double> const key = KFSp_GetSpatialRuns(place.key, dimension);
    for (int i = 0; i < dimension; ++i) {
        prev.outTangent[i] += prev.value[i];
        next.inTangent[i] += next.value[i];
    }
    CRV_Curve const curve{static_cast<short>(dimension), prev.value, prev.outTangent, next.inTangent, next.value};
    std::array<double, 5 * KFSp_SegmentCurve::MaxDimension> rows{};
    if (int const code = CRV_SubdivideCurve(&curve, rows.data(), t); code != 0) return code;
    auto const row = [&](int index, int i) { return rows[static_cast<std::size_t>(index * dimension + i)]; };
    for (int i = 0; i < dimension; ++i) {
        prev.outTangent[i] = row(0, i) - prev.value[i];
        next.inTangent[i] = row(4, i) - next.value[i];
        key.value[i] = row(2, i);
        key.inTangent[i] = row(1, i) - key.value[i];
        key.outTangent[i] = row(3, i) - key.value[i];
    }

    place.key->flags |= KFS_KeyFlag_TangentsSet;
    for (KFS_KeyScalar* const changed : {place.key, place.prev, place.next})
        changed->spFlags &= ~KFS_KeySpFlag_Modifiable;
    // On a straight run the path stays made of keys without tangents.
    auto const size = static_cast<std::size_t>(dimension);
    if (KFSp_IsZero({prev.inTangent, size}) && KFSp_IsZero({next.outTangent, size}))
        FlattenTangents(place.key, dimension);
    return 0;
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

void ClearModifiable(Place const& place)
{
    for (KFS_KeyScalar* const changed : {place.key, place.prev, place.next})
        if (changed) changed->flags &= static_cast<unsigned short>(~KFS_KeyFlag_Modifiable);
}

int SplitSpeedGraph(Place const& place)
{
    double total = 0.0;
    if (int const code = KFSp_SumArcs(place.data, place.prevIndex, place.nextIndex, &total); code != 0) return code;
    double const prevArc = place.prev->arcLength;
    double const nextArc = place.next->arcLength;
    place.prev->arcLength = 0.0;
    place.next->arcLength = total;

    SpeedNumbers prev = GetSpeedNumbers(place.prev);
    SpeedNumbers next = GetSpeedNumbers(place.next);
    SpeedNumbers key = GetSpeedNumbers(place.key);
    int const code =
        KFSp_ComputeTempSubdivision(1, place.X(), place.Duration(), place.NonDecreasing() ? 1 : 0, place.PrevIsLinear(),
                                    place.NextIsLinear(), prev.data(), next.data(), key.data());
    SetSpeedNumbers(place.prev, prev);
    SetSpeedNumbers(place.next, next);
    SetSpeedNumbers(place.key, key);
    if (code != 0) return code;
    place.prev->arcLength = prevArc;
    place.next->arcLength = nextArc;
    ClearModifiable(place);
    return 0;
}

int SplitSpatial(Place const& place)
{
    int code = 0;
    if (place.Wants(KFSp_Tangents_Spatial) && place.Between())
        code = SplitPath(place);
    else if (place.IsNewKey())
        code = TakeValue(place);
    if (code != 0 || !place.Wants(KFSp_Tangents_Temporal) || !place.Between()) return code;
    return SplitSpeedGraph(place);
}

int SplitHandles(Place const& place)
{
    bool const prevLinear = place.PrevIsLinear();
    bool const nextLinear = place.NextIsLinear();
    int const code = KFSp_ComputeTempSubdivision(
        place.stream->GetDimension(), place.X(), place.Duration(), place.NonDecreasing() ? 1 : 0, prevLinear,
        nextLinear, place.prev ? KFSp_Numbers(place.prev) : nullptr, place.next ? KFSp_Numbers(place.next) : nullptr,
        KFSp_Numbers(place.key));
    ClearModifiable(place);
    // The handles carry the line now.
    if (prevLinear) place.prev->outInterp = KFS_Interp_Spline;
    if (nextLinear) place.next->inInterp = KFS_Interp_Spline;
    return code;
}

int SplitPlain(Place const& place)
{
    int code = 0;
    if (place.Wants(KFSp_Tangents_Temporal)) code = SplitHandles(place);
    // The split of a held segment is that of a curve which nobody sees.
    bool const takesValue = !place.Wants(KFSp_Tangents_Temporal) || place.IsHeld();
    return code == 0 && place.IsNewKey() && takesValue ? TakeValue(place) : code;
}

int Split(Place* place)
{
    KFS_KeyScalar* at = nullptr;
    if (int const code = KFSp_GetNeighborsFromTime(place->stream, place->time, 0, &at, &place->prev, &place->next,
                                                   &place->prevIndex, &place->nextIndex, nullptr);
        code != 0)
        return code;
    if (place->IsNewKey()) RestHandles(*place);
    return place->stream->IsSpatial() ? SplitSpatial(*place) : SplitPlain(*place);
}

// Only the speed graph of a custom stream has numbers that could be split.
bool NeedsPlainValue(Place const& place)
{
    return place.IsNewKey() || !place.stream->IsSpatial() || place.Wants(KFSp_Tangents_Spatial);
}

}  // namespace

int KFSp_SubdivideSpline(KFS_Stream* stream, int time, char mode, KFS_KeyScalar* key)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_Subdivide, stream, KFSp_Row_InquireKey); code != 0) return code;
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    if (stream->HasNoKeys() || KFSp_ItemCount(data) == 0)
        return KFSp_ReportErr(KFSp_Op_Subdivide, KFS_Err_NoKeys, KFSp_Row_Subdivide);
    Place place{stream, data, time, mode, key};
    if ((stream->IsCustom() || stream->IsTemporarilyNonCustom()) && NeedsPlainValue(place))
        return KFSp_RefuseCustomValue(KFSp_Op_Subdivide, KFSp_Row_ConvertTo);
    if (int const code = stream->UpdateStream(); code != 0) return code;
    if (!place.IsNewKey()) place.time = key->time;
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(data->keys, error);
        if (error.None()) error.Keep(Split(&place));
    }
    return error.Code();
}
