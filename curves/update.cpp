// The repair of stale keys. It touches the marked ranges only, so its cost doesn't depend on how many keys the list
// has.
//
// The order is part of the result: path lengths first, because the automatic speeds of spatial keys are distances over
// time; float times last, because they depend on lengths and speeds.
#include "curves/update.h"

#include "curves/arcs_private.h"
#include "curves/autotangents_private.h"
#include "curves/floatkeys_private.h"
#include "curves/segment_private.h"
#include "frame/report_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cmath>

namespace {

struct StaleRange {
    int first;
    int last;
};

// What one pass works on. The ranges are copies: a lookup inside the pass may run a second one, which consumes the
// marks.
struct Pass {
    KFS_Stream const* stream;
    KFS_StreamKeyData const* data;
    int count;
    bool custom;
    StaleRange tangents;
    StaleRange arcs;
};

// The marks as indices of the list. A mark may lie past a list that has become shorter.
StaleRange ClipToList(int const bounds[2], int count)
{
    if (bounds[0] == KFS_INVALID_INDEX || bounds[1] == KFS_INVALID_INDEX) return {0, -1};
    return {std::max(bounds[0], 0), std::min(bounds[1], count - 1)};
}

template <class Visit>
int ForKeys(Pass const& pass, StaleRange range, Visit&& visit)
{
    for (int i = range.first; i <= range.last; ++i) {
        KFS_KeyScalar* key = nullptr;
        if (int const code = KFSp_GetKey(pass.data, i, &key); code != 0) return code;
        if (int const code = visit(key); code != 0) return code;
    }
    return 0;
}

// Visits the keys `first` and following together with the key behind each, as long as that one is in the range too.
template <class Visit>
int ForArcs(Pass const& pass, Visit&& visit)
{
    KFS_KeyScalar* a = nullptr;
    if (pass.arcs.first >= pass.arcs.last) return 0;
    if (int const code = KFSp_GetKey(pass.data, pass.arcs.first, &a); code != 0) return code;
    for (int next = pass.arcs.first + 1; next <= pass.arcs.last; ++next) {
        KFS_KeyScalar* b = nullptr;
        if (int const code = KFSp_GetKey(pass.data, next, &b); code != 0) return code;
        // A record without the block has no place for an arc.
        if (KFSp_HasSpatialBlock(a)) {
            if (int const code = visit(a, b, next); code != 0) return code;
        }
        a = b;
    }
    return 0;
}

bool WantsSpatialTangents(KFS_KeyScalar const* key)
{
    if (!KFSp_HasSpatialBlock(key)) return false;
    return (key->spFlags & KFS_KeySpFlag_Modifiable) != 0 || (key->flags & KFS_KeyFlag_TangentsSet) == 0;
}

int RepairSpatialTangents(Pass const& pass)
{
    if (pass.stream->GetSpInterp() != KFS_SpInterp_Auto) return 0;
    return ForKeys(pass, pass.arcs, [&](KFS_KeyScalar* key) {
        if (!WantsSpatialTangents(key)) return 0;
        return KFSp_SetDefaultKeyframeTangents(pass.stream, key->time, KFSp_Tangents_Spatial, key);
    });
}

// The path is measured in the coordinates that the stream's multiplier makes of the value's, so that a distance means
// what it means to the host, pixel aspect and all.
int MeasurePath(Pass const& pass, KFS_KeyScalar* a, KFS_KeyScalar const* b)
{
    int const dimension = pass.stream->GetDimension();
    M_Vector4T<double> const& multiplier = pass.stream->GetMultiplier();
    KFSp_SegmentCurve path(static_cast<short>(dimension));
    KFSp_SpatialRuns<double> const from = KFSp_GetSpatialRuns(a, dimension);
    KFSp_SpatialRuns<double const> const to = KFSp_GetSpatialRuns(b, dimension);
    for (int i = 0; i < dimension; ++i) {
        double const m = multiplier[i % 4];
        path.p0[i] = m * from.value[i];
        path.p3[i] = m * to.value[i];
        path.p1[i] = m * from.outTangent[i] + path.p0[i];
        path.p2[i] = m * to.inTangent[i] + path.p3[i];
    }
    return CRV_BuildArcSpline(&path.curve, &a->remapTable, &a->arcLength, pass.stream->GetAccuracy());
}

double Chord(KFS_KeyScalar const* a, KFS_KeyScalar const* b, int dimension)
{
    double const* const from = KFSp_Numbers(a);
    double const* const to = KFSp_Numbers(b);
    double sum = 0.0;
    for (int i = 0; i < dimension; ++i) {
        double const difference = to[i] - from[i];
        sum += difference * difference;
    }
    return std::sqrt(sum);
}

// An arc that needs no table: a chord, or a duration. The last key of the list begins no arc.
template <class Length>
int MeasureStraight(Pass const& pass, Length&& length)
{
    return ForArcs(
        pass,
        [&](KFS_KeyScalar* a, KFS_KeyScalar* b, int next) {
            a->arcLength = length(a, b);
            if (next == pass.count - 1 && KFSp_HasSpatialBlock(b)) b->arcLength = 0.0;
            return 0;
        });
}

bool HasCurvedPath(Pass const& pass)
{
    return pass.stream->IsSParametrized() && KFSp_HasPathDimension(pass.stream);
}

int RepairArcs(Pass const& pass)
{
    if (pass.custom) {
        return MeasureStraight(
            pass, [&](KFS_KeyScalar const* a,
                      KFS_KeyScalar const* b) { return KFSp_Seconds(b->time, a->time, pass.stream->GetTimeScale()); });
    }
    if (int const code = RepairSpatialTangents(pass); code != 0) return code;
    if (HasCurvedPath(pass))
        return ForArcs(
            pass, [&](KFS_KeyScalar* a, KFS_KeyScalar* b, int) { return MeasurePath(pass, a, b); });
    return MeasureStraight(
        pass, [&](KFS_KeyScalar const* a, KFS_KeyScalar const* b) { return Chord(a, b, pass.stream->GetDimension()); });
}

bool HasAutomaticHandles(KFS_KeyScalar const* key)
{
    return (key->flags & KFS_KeyFlag_Modifiable) != 0 &&
           (key->inInterp == KFS_Interp_Spline || key->outInterp == KFS_Interp_Spline);
}

int RepairHandlesAndTimes(Pass const& pass)
{
    int const code = ForKeys(pass, pass.tangents, [&](KFS_KeyScalar* key) {
        if (!HasAutomaticHandles(key)) return 0;
        return KFSp_SetDefaultKeyframeTangents(pass.stream, key->time, KFSp_Tangents_Temporal, key);
    });
    if (code != 0 || pass.custom || !pass.stream->IsSpatial()) return code;
    return KFSp_ComputeFloatTimes(pass.stream, pass.tangents.first, pass.tangents.last);
}

int Repair(Pass const& pass)
{
    if (pass.stream->IsSpatial()) {
        if (int const code = RepairArcs(pass); code != 0) return code;
    }
    return RepairHandlesAndTimes(pass);
}

}  // namespace

int KFS_Stream::UpdateStream() const
{
    if (int const code = KFSp_CheckStream(KFSp_Op_UpdateStream, this, KFSp_Row_Merge); code != 0) return code;
    if (!CanUpdateStream()) return 0;
    KFS_StreamKeyData* const data = GetKeyDataForModify();
    if (!KFSp_IsStale(data)) return 0;

    KFSp_FirstError error;
    int const count = KFSp_ItemCount(data);
    if (HasKeys() && count > 0) {
        KFSp_ScConstPin const pin(data->keys, error);
        if (error.None()) {
            error.Keep(Repair({this, data, count, IsCustom() || IsTemporarilyNonCustom(),
                               ClipToList(data->invalidKeyIndex, count), ClipToList(data->arcInvalidKeyIndex, count)}));
        }
    }
    // Consumed after a failure too: a stream that can't be repaired would otherwise try again with each read.
    std::fill_n(data->invalidKeyIndex, 2, KFS_INVALID_INDEX);
    std::fill_n(data->arcInvalidKeyIndex, 2, KFS_INVALID_INDEX);
    return error.Code();
}

int KFS_Stream::UpdateStreamIfStaleTangents(int index) const
{
    int const* const stale = GetInvalidKeyIndex();
    return index >= stale[0] && index <= stale[1] ? UpdateStream() : 0;
}

int KFS_Stream::UpdateStreamIfFloatItem(KFS_KeyScalar const* key, int index) const
{
    if (!KFSp_Floats(key)) return 0;
    int const* const stale = GetArcInvalidKeyIndex();
    return index >= stale[0] && index <= stale[1] ? UpdateStream() : 0;
}

int KFS_ForceUpdateStream(KFS_Stream const* stream)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_ForceUpdate, stream, KFSp_Row_Merge); code != 0) return code;
        stream = KFSp_Seen(stream);
        auto const count = static_cast<short>(stream->GetKeyCount());
        if (int const code = stream->SetInvalid(-1, count); code != 0) return code;
        if (stream->IsSpatial()) {
            if (int const code = stream->SetArcInvalid(-1, count); code != 0) return code;
        }
        return stream->UpdateStream();
    });
}
