// Automatic handles and tangents of one key, derived from the keys around it: for the update pass and for a key that is
// about to enter the list.
#include "curves/autotangents_private.h"

#include "curves/neighbours_private.h"
#include "frame/report_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"

#include <algorithm>
#include <cmath>
#include <optional>

namespace {

// Components closer than this coincide.
constexpr double Coincidence = 1e-12;

int SpanOf(KFS_KeyScalar const* from, KFS_KeyScalar const* to)
{
    return from && to ? KFSp_TimeDifference(to->time, from->time) : 0;
}

// Between the keys whose difference gives the slope.
int OuterSpan(KFSp_Neighbours const& around)
{
    if (around.Both()) return SpanOf(around.prev, around.next);
    if (around.prev && around.at) return SpanOf(around.prev, around.at);
    return SpanOf(around.at, around.next);
}

// On which side the curve goes straight on, if exactly one side is linear and the other a spline.
enum class StraightSide { None, In, Out };

StraightSide GetStraightSide(KFS_KeyScalar const* key)
{
    if (key->inInterp == KFS_Interp_Linear && key->outInterp == KFS_Interp_Spline) return StraightSide::In;
    if (key->inInterp == KFS_Interp_Spline && key->outInterp == KFS_Interp_Linear) return StraightSide::Out;
    return StraightSide::None;
}

// The number of units over which the slope is taken, once a straight side has its say.
int SlopeSpan(KFSp_Neighbours const& around, StraightSide straight)
{
    switch (straight) {
    case StraightSide::In: return SpanOf(around.prev, around.at);
    case StraightSide::Out: return SpanOf(around.at, around.next);
    case StraightSide::None: break;
    }
    return OuterSpan(around);
}

// A value or a distance at the key before, at the key and at the key after.
using Level = std::optional<double>;

double Slope(Level prev, Level at, Level next, double seconds)
{
    if (next && prev) return (*next - *prev) / seconds;
    if (at && prev) return (*at - *prev) / seconds;
    if (next && at) return (*next - *at) / seconds;
    return 0.0;
}

void SetPlainHandles(KFS_Stream const* stream, KFSp_Neighbours const& around, KFS_KeyScalar* key)
{
    StraightSide const straight = GetStraightSide(key);
    KFS_KeyScalar const* const prev = straight == StraightSide::Out ? nullptr : around.prev;
    KFS_KeyScalar const* const next = straight == StraightSide::In ? nullptr : around.next;
    double const seconds =
        static_cast<double>(SlopeSpan(around, straight)) / static_cast<double>(stream->GetTimeScale());

    auto const valueOf = [](KFS_KeyScalar const* source, int i) {
        return source ? Level(KFSp_Numbers(source)[i]) : Level();
    };
    int const dimension = stream->GetDimension();
    KFSp_TemporalRuns<double> const runs = KFSp_GetTemporalRuns(key, dimension);
    for (int i = 0; i < dimension; ++i) {
        double const speed = Slope(valueOf(prev, i), valueOf(around.at, i), valueOf(next, i), seconds);
        runs.inSpeed[i] = speed;
        runs.outSpeed[i] = speed;
        runs.inInfluence[i] = KFSp_OneSixth;
        runs.outInfluence[i] = KFSp_OneSixth;
    }
    key->flags |= KFS_KeyFlag_Continuous;
}

// Adds the arcs that begin at the keys strictly between two.
int AddArcsBetween(KFS_StreamKeyData const* data, int first, int last, double* distance)
{
    for (int index = first + 1; index < last; ++index) {
        KFS_KeyScalar const* key = nullptr;
        if (int const code = KFSp_GetConstKey(data, index, &key)) return code;
        *distance += key->arcLength;
    }
    return 0;
}

// Two of the keys on a line of distance along the path. Of three keys the middle one stays empty, so a middle key with
// one straight side gets speed 0. Plain streams differ; saved projects rely on both.
struct Distances {
    Level prev;
    Level at;
    Level next;
};

int MeasureDistances(KFS_StreamKeyData const* data, KFSp_Neighbours const& around, Distances* distances)
{
    int first = around.prevIndex;
    int last = around.nextIndex;
    Level* end = &distances->next;
    Level* begin = &distances->prev;
    KFS_KeyScalar const* from = around.prev;
    if (!around.next) {
        end = &distances->at;
        last = around.atIndex;
    }
    if (!around.prev) {
        begin = &distances->at;
        first = around.atIndex;
        from = around.at;
    }
    bool const twoKeys = (around.prev && (around.next || around.at)) || (around.at && around.next);
    if (!twoKeys) return 0;
    double length = from->arcLength;
    if (int const code = AddArcsBetween(data, first, last, &length)) return code;
    *begin = 0.0;
    *end = length;
    return 0;
}

int SetSpatialHandles(KFS_Stream const* stream, KFS_StreamKeyData const* data, KFSp_Neighbours const& around,
                      KFS_KeyScalar* key)
{
    Distances distances;
    if (int const code = MeasureDistances(data, around, &distances)) return code;
    StraightSide const straight = GetStraightSide(key);
    if (straight == StraightSide::In) distances.next.reset();
    if (straight == StraightSide::Out) distances.prev.reset();
    double const seconds =
        static_cast<double>(SlopeSpan(around, straight)) / static_cast<double>(stream->GetTimeScale());
    double const speed = Slope(distances.prev, distances.at, distances.next, seconds);
    key->inSpeed = speed;
    key->outSpeed = speed;
    key->inInfluence = KFSp_OneSixth;
    key->outInfluence = KFSp_OneSixth;
    key->flags |= KFS_KeyFlag_Continuous;
    return 0;
}

// A missing neighbour doesn't bend the path. Without components there is nothing that could be called straight.
bool IsStraight(KFS_KeyScalar const* neighbour, double const* farTangent, int dimension)
{
    return !neighbour || (dimension >= 1 && KFSp_IsZero({farTangent, static_cast<std::size_t>(dimension)}));
}

int SetPathTangents(KFS_Stream const* stream, int time, KFS_KeyScalar* key)
{
    KFSp_Neighbours around;
    if (int const code = KFSp_FindAround(stream, time, 1, &around)) return code;
    short const dimension = stream->GetDimension();
    auto const valueOf = [](KFS_KeyScalar const* source) { return source ? KFSp_Numbers(source) : nullptr; };
    double const* const farIn = around.prev ? KFSp_GetSpatialRuns(around.prev, dimension).inTangent : nullptr;
    double const* const farOut = around.next ? KFSp_GetSpatialRuns(around.next, dimension).outTangent : nullptr;
    KFSp_SpatialRuns<double> const runs = KFSp_GetSpatialRuns(key, dimension);
    bool const straight = IsStraight(around.prev, farIn, dimension) && IsStraight(around.next, farOut, dimension);
    if (straight && !(key->spFlags & KFS_KeySpFlag_Modifiable)) {
        std::fill_n(runs.inTangent, std::max<int>(dimension, 0), 0.0);
        std::fill_n(runs.outTangent, std::max<int>(dimension, 0), 0.0);
    } else if (int const code = KFSp_ComputeDefaultSpTangents(dimension, valueOf(around.prev), valueOf(around.at),
                                                              valueOf(around.next), runs.inTangent, runs.outTangent)) {
        return code;
    }
    key->spFlags |= KFS_KeySpFlag_Continuous;
    key->flags |= KFS_KeyFlag_TangentsSet;
    return 0;
}

int SetTangents(KFS_Stream const* stream, KFS_StreamKeyData const* data, int time, char mode, bool custom,
                KFS_KeyScalar* key)
{
    KFSp_Neighbours around;
    if (int const code = KFSp_FindAround(stream, time, 0, &around)) return code;
    bool const temporal = (mode & KFSp_Tangents_Temporal) != 0;
    if (!stream->IsSpatial()) {
        if (temporal) SetPlainHandles(stream, around, key);
        return 0;
    }
    if (temporal) {
        if (int const code = SetSpatialHandles(stream, data, around, key)) return code;
    }
    return (mode & KFSp_Tangents_Spatial) != 0 && !custom ? SetPathTangents(stream, time, key) : 0;
}

bool Coincide(int dimension, double const* a, double const* b)
{
    for (int i = 0; i < dimension; ++i)
        if (!(std::fabs(a[i] - b[i]) < Coincidence)) return false;
    return true;
}

}  // namespace

int KFSp_SetDefaultKeyframeTangents(KFS_Stream const* stream, int time, char mode, KFS_KeyScalar* key)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetDefaultTangents, stream, KFSp_Row_SetTangents)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (stream->HasNoKeys() || KFSp_ItemCount(data) == 0)
        return KFSp_ReportErr(KFSp_Op_SetDefaultTangents, KFS_Err_NoKeys, KFSp_Row_SetTangents);
    // While a custom stream carries a plain description its records still hold the client's bytes.
    bool const custom = stream->IsCustom() || stream->IsTemporarilyNonCustom();
    if (custom && !stream->IsSpatial()) return 0;
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (error.None()) error.Keep(SetTangents(stream, data, time, mode, custom, key));
    }
    return error.Code();
}

void KFSp_SetHandlesBetween(KFS_Stream const* stream, KFS_KeyScalar* prev, KFS_KeyScalar* next, KFS_KeyScalar* key)
{
    KFSp_Neighbours around;
    around.prev = prev;
    around.next = next;
    SetPlainHandles(stream, around, key);
}

int KFSp_ComputeDefaultSpTangents(short dimension, double const* prev, double const* cur, double const* next,
                                  double* inTangent, double* outTangent)
{
    double const* const from = prev ? prev : cur;
    double const* const to = next ? next : cur;
    bool const chord = from && to && from != to;
    for (int i = 0; i < dimension; ++i) {
        outTangent[i] = chord ? (to[i] - from[i]) * KFSp_OneSixth : 0.0;
        inTangent[i] = chord ? -outTangent[i] : 0.0;
    }
    if (prev && cur && next) {
        int const count = std::max<int>(dimension, 0);
        if (Coincide(dimension, next, cur)) std::fill_n(outTangent, count, 0.0);
        if (Coincide(dimension, prev, cur)) std::fill_n(inTangent, count, 0.0);
    }
    return 0;
}
