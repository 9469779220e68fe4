// A curve dragged by one of its points: which handles it takes, and their way into the keys.
#include "curves/manipulate.h"

#include "curves/neighbours_private.h"
#include "curves/segment_private.h"
#include "curves/spacetangents.h"
#include "curves/spatial_private.h"
#include "curves/tangents.h"
#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/valuedata_private.h"

#include <cmath>
#include <vector>

namespace {

struct Drag {
    KFS_Stream* stream;
    int time;
    int dimension;
    double const* target;

    bool DragsAll() const { return dimension == -1; }
    bool Drags(int component) const { return DragsAll() || dimension == component; }
};

int Refuse()
{
    return KFSp_ReportRow(KFSp_Op_DirectManipArc, KFS_Err_ArcLength2D, KFSp_Row_CantManipulate);
}

bool HasFlatPath(KFS_Stream const* stream)
{
    return stream->IsSpatial() && !KFSp_HasCustomRecords(stream) && stream->GetDimension() == 2;
}

bool HasCurve(KFS_Stream const* stream, int dimension)
{
    if (stream->IsSpatial() || KFSp_HasCustomRecords(stream)) return false;
    return dimension >= -1 && dimension < stream->GetDimension();
}

int CheckInside(KFSp_Neighbours const& around)
{
    if (around.Both() && !around.at) return 0;
    return KFSp_ReportRow(KFSp_Op_ConstructCurve, KFS_Err_TimeOutsideKeys, KFSp_Row_TimeOutsideKeys);
}

// What the segment has been for readers until it became a spline.
struct Seen {
    KFS_KeyScalar const* held = nullptr;  // the key whose value it showed, if it held
};

// Makes a spline of the segment between two keys, with the handles that its other sides were answered to have. Nothing is
// written where the keys lie too far apart for that.
int MakeSpline(KFS_Stream const* stream, KFS_KeyScalar* a, KFS_KeyScalar* b, Seen* seen)
{
    if (a->outInterp == KFS_Interp_Hold)
        seen->held = a;
    else if (b->inInterp == KFS_Interp_Hold)
        seen->held = b;
    bool const isSpline = a->outInterp == KFS_Interp_Spline && b->inInterp == KFS_Interp_Spline;
    int const dimension = stream->GetDimension();
    double const seconds = KFSp_Seconds(b->time, a->time, stream->GetTimeScale());
    KFSp_TemporalRuns<double> const from = KFSp_GetTemporalRuns(a, dimension);
    KFSp_TemporalRuns<double> const to = KFSp_GetTemporalRuns(b, dimension);
    auto const speedOf = [&](int i) { return seen->held ? 0.0 : (to.value[i] - from.value[i]) / seconds; };
    for (int i = 0; i < dimension; ++i)
        if (!isSpline && !std::isfinite(speedOf(i))) return CRV_Err_NotFinite;
    for (int i = 0; i < dimension; ++i) {
        double const speed = speedOf(i);
        if (a->outInterp != KFS_Interp_Spline) {
            from.outSpeed[i] = speed;
            from.outInfluence[i] = KFSp_OneSixth;
        }
        if (b->inInterp != KFS_Interp_Spline) {
            to.inSpeed[i] = speed;
            to.inInfluence[i] = KFSp_OneSixth;
        }
    }
    a->outInterp = KFS_Interp_Spline;
    b->inInterp = KFS_Interp_Spline;
    for (KFS_KeyScalar* const key : {a, b}) key->flags &= static_cast<unsigned short>(~KFS_KeyFlag_Modifiable);
    return 0;
}

// The graph tangents of the segment's two sides, `dimension` numbers each.
class Tangents {
public:
    explicit Tangents(int dimension) : size_(static_cast<std::size_t>(dimension)), numbers_(4 * size_) {}

    double* OutX() { return numbers_.data(); }
    double* OutY() { return numbers_.data() + size_; }
    double* InX() { return numbers_.data() + 2 * size_; }
    double* InY() { return numbers_.data() + 3 * size_; }

private:
    std::size_t size_;
    std::vector<double> numbers_;
};

// By how much a component's curve has to change at x, so that the value that was seen there changes as asked.
int FindChange(Drag const& drag, int component, Seen const& seen, CRV_Curve const& curve, double x, double* change)
{
    *change = drag.target[component];
    if (!seen.held) return 0;
    double height = 0.0;
    if (int const code = CRV_EvaluateYFromX(&curve, &height, x)) return code;
    *change += KFSp_Numbers(seen.held)[component] - height;
    return 0;
}

// A component's new handles. The curve begins at x = 0 wherever the segment lies, so that no digit of a time is lost.
int DragComponent(Drag const& drag, KFSp_Neighbours const& around, Seen const& seen, int component, Tangents* tangents)
{
    KFS_Stream const* const stream = drag.stream;
    KFSp_SegmentCurve segment(2);
    CRV_Curve& curve = segment.curve;
    unsigned char isHold = 0;
    if (int const code = KFSp_ConstructCurve(stream, KFS_INVALID_INDEX, drag.time,
                                             drag.DragsAll() ? component : drag.dimension, 1, 0, &isHold, &curve))
        return code;
    double const x = KFSp_Seconds(drag.time, around.prev->time, stream->GetTimeScale());
    double way[2] = {0.0, 0.0};
    if (drag.Drags(component)) {
        if (int const code = FindChange(drag, component, seen, curve, x, &way[1])) return code;
    }
    bool const rising = (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0;
    CRV_DirectManipState state{rising ? CRV_Drag_RisingGraph : CRV_Drag_Graph, 0.0};
    double t = 0.0;
    if (int const code = CRV_TFromX(&curve, &t, x)) return code;
    if (int const code = CRV_DirectManipSetup(&state, t)) return code;
    if (int const code = CRV_DirectManipCurve(&curve, way, &state)) return code;
    tangents->OutX()[component] = curve.p1[0];
    tangents->OutY()[component] = curve.p1[1];
    tangents->InX()[component] = curve.p2[0] - curve.p3[0];
    tangents->InY()[component] = curve.p2[1];
    return 0;
}

int DragGraph(Drag const& drag, KFSp_Neighbours const& around)
{
    if (int const code = CheckInside(around)) return code;
    int const dimension = drag.stream->GetDimension();
    Tangents tangents(dimension);
    Seen seen;
    if (int const code = MakeSpline(drag.stream, around.prev, around.next, &seen)) return code;
    if (int const code = KFSp_ClearCache(drag.stream)) return code;
    for (int i = 0; i < dimension; ++i)
        if (int const code = DragComponent(drag, around, seen, i, &tangents)) return code;
    if (int const code =
            KFS_SetKeyTangentsF(drag.stream, around.prevIndex, nullptr, nullptr, tangents.OutX(), tangents.OutY(), 1.0))
        return code;
    return KFS_SetKeyTangentsF(drag.stream, around.nextIndex, tangents.InX(), tangents.InY(), nullptr, nullptr, 1.0);
}

int IndexOf(KFS_StreamKeyData const* data, KFS_KeyScalar const* key, int* index)
{
    bool found = false;
    return KFSp_SearchKeys(data, key->time, &found, index);
}

int DragPath(Drag const& drag, KFSp_Neighbours const& around)
{
    if (int const code = CheckInside(around)) return code;
    // Not always between the two keys beside the time: float keys that crowd have other times than the point that comes by.
    KFSp_PathPoint held;
    if (int const code = KFSp_FindOnPath(drag.stream, drag.time, &held)) return code;
    int index = 0;
    if (int const code = IndexOf(drag.stream->GetKeyData(), held.first, &index)) return code;
    KFSp_SegmentCurve path(drag.stream->GetDimension());
    KFSp_FillPathSegment(held.first, held.second, drag.stream->GetDimension(), path.curve);
    CRV_DirectManipState state{CRV_Drag_Path, 0.0};
    if (int const code = CRV_DirectManipSetup(&state, held.t)) return code;
    if (int const code = CRV_DirectManipCurve(&path.curve, drag.target, &state)) return code;
    // The kernel leaves the first key's tangent in the third point, and the second key's in the second one.
    if (int const code = KFS_SetKeySpaceTangentsF(drag.stream, index, -1, nullptr, path.p2)) return code;
    return KFS_SetKeySpaceTangentsF(drag.stream, index + 1, -1, path.p1, nullptr);
}

int DirectManip(Drag const& drag, bool spatial)
{
    KFS_Stream* const stream = drag.stream;
    if (int const code = KFSp_CheckStream(KFSp_Op_DirectManipArc, stream, KFSp_Row_AlterKey)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_DirectManipArc, KFS_Err_NoKeys, KFSp_Row_AlterKey);
    if (!spatial && !HasCurve(stream, drag.dimension)) return Refuse();

    KFSp_FirstError error;
    {
        KFSp_ScPin pin(data->keys, error);
        KFSp_Neighbours around;
        if (error.None()) error.Keep(stream->UpdateStream());
        if (error.None()) error.Keep(KFSp_FindAround(stream, drag.time, spatial, &around));
        if (spatial && !HasFlatPath(stream)) {
            pin.Leave();  // hosts that know of it give it back themselves
            return Refuse();
        }
        if (error.None()) error.Keep(spatial ? DragPath(drag, around) : DragGraph(drag, around));
    }
    return error.Code();
}

}  // namespace

int KFS_DirectManipArc(KFS_Stream* stream, T_Time* time, unsigned char spatial, int dimension, double const* target)
{
    return KFSp_Boundary([&] { return DirectManip({stream, time->value, dimension, target}, spatial != 0); });
}
