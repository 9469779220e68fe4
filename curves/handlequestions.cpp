// Questions about temporal handles that store nothing.
#include "curves/keyhandles_private.h"
#include "curves/neighbours_private.h"
#include "curves/tangents.h"

#include <algorithm>
#include <cmath>

namespace {

// One component of a side: its key, the neighbour that it points to, and the proposed handle.
struct Proposal {
    double value;
    double neighbourValue;
    double time;  // seconds
    double neighbourTime;
    double speed;
    double influence;
};

// A side's proposed numbers as a caller hands them in, for the answers too; either may be null.
struct ProposedSide {
    double* speeds;
    double* influences;

    bool IsAskedFor() const { return speeds || influences; }
};

// A handle that ends between both values. False where the proposal does so already.
bool ClampHandle(KFSp_Side side, Proposal const& proposal, double* speed, double* influence)
{
    double const c = proposal.value;
    double const n = proposal.neighbourValue;
    double const v = proposal.speed;
    double const time = proposal.time;
    bool const in = side == KFSp_Side::In;
    bool const neighbourIsBehind =
        in ? (n > c && v > 0.0) || (c > n && v < 0.0) : (n > c && v < 0.0) || (c > n && v > 0.0);
    if (neighbourIsBehind) {
        *speed = 0.0;
        *influence = proposal.influence;
        return true;
    }
    if (v == 0.0) return false;
    double const dt = in ? time - proposal.neighbourTime : proposal.neighbourTime - time;
    double const end = in ? c - proposal.influence * dt * v : v * proposal.influence * dt + c;
    double const limit = std::clamp(end, std::min(n, c), std::max(n, c));
    if (limit == end) return false;
    double const reached = (limit - c) / v + time;  // when the handle gets there
    *speed = 0.0;
    if (time > reached) *speed = (c - limit) / (time - reached);
    if (time < reached) *speed = (limit - c) / (reached - time);
    *influence = std::fabs((reached - time) / dt);
    return true;
}

void ClampSide(KFS_Stream const* stream, KFS_KeyScalar const* key, KFS_KeyScalar const* neighbour, KFSp_Side side,
               ProposedSide const& asked, unsigned char* clamped)
{
    KFSp_Handles<double const> const stored = KFSp_GetHandles(stream, key, side);
    double const scale = static_cast<double>(stream->GetTimeScale());
    for (int i = 0; i < stored.count; ++i) {
        Proposal const proposal{KFSp_Numbers(key)[i],
                                KFSp_Numbers(neighbour)[i],
                                static_cast<double>(key->time) / scale,
                                static_cast<double>(neighbour->time) / scale,
                                asked.speeds ? asked.speeds[i] : stored.speed[i],
                                asked.influences ? asked.influences[i] : stored.influence[i]};
        double speed = 0.0;
        double influence = 0.0;
        if (!ClampHandle(side, proposal, &speed, &influence)) continue;
        if (asked.speeds) asked.speeds[i] = speed;
        if (asked.influences) asked.influences[i] = influence;
        if (clamped) *clamped = 1;
    }
}

int GetClamped(KFS_Stream const* stream, int index, ProposedSide const& in, ProposedSide const& out,
               unsigned char* clamped)
{
    KFSp_Refusal const refusal{KFSp_Op_GetClampedVelInfl, KFSp_Row_GetValue};
    if (int const code = KFSp_CheckHandleAccess(stream, refusal, refusal)) return code;
    stream = KFSp_Seen(stream);
    if (int const code = stream->UpdateStreamIfStaleTangents(index)) return code;
    KFS_KeyScalar* key = nullptr;
    if (int const code = KFSp_GetHandleKey(stream, stream->GetKeyData(), index, &key)) return code;
    if (stream->HasNoKeys() || !KFSp_HasHandleRuns(stream)) return 0;
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    if (int const code = KFSp_GetNeighborsFromIndex(stream, index, 0, &prev, &next, nullptr, nullptr)) return code;
    if (prev && in.IsAskedFor()) ClampSide(stream, key, prev, KFSp_Side::In, in, clamped);
    if (next && out.IsAskedFor()) ClampSide(stream, key, next, KFSp_Side::Out, out, clamped);
    return 0;
}

int GetZeroVelocityPoints(KFS_Stream const* stream, int index, int dimensionIndex, int* count, T_Time* times,
                          double* secondDerivatives)
{
    KFSp_Refusal const refusal{KFSp_Op_GetZeroVelocityPoints, KFSp_Row_AlterKey};
    if (int const code = KFSp_CheckHandleAccess(stream, refusal, refusal)) return code;
    stream = KFSp_Seen(stream);
    if (int const code = stream->UpdateStream()) return code;
    KFS_KeyScalar* key = nullptr;
    if (int const code = KFSp_GetHandleKey(stream, stream->GetKeyData(), index, &key)) return code;
    KFSp_SegmentCurve segment(2);
    unsigned char isHold = 0;
    if (int const code = KFSp_ConstructCurve(stream, index, 0, dimensionIndex, 0, 0, &isHold, &segment.curve))
        return code;
    if (isHold) {
        *count = 0;
        return 0;
    }
    double seconds[2] = {};
    if (int const code = CRV_EvaluateXFromYPrime(&segment.curve, count, seconds, 0.0)) return code;
    unsigned int const scale = stream->GetTimeScale();
    for (int i = 0; i < *count; ++i) {
        times[i] = {T_FpLong2TimeValue(scale, seconds[i]), scale};
        if (!secondDerivatives) continue;
        if (int const code = CRV_Evaluate1dDeriv2FromX(&segment.curve, &secondDerivatives[i], seconds[i])) return code;
    }
    return 0;
}

}  // namespace

int KFS_GetClampedVelInflF(KFS_Stream const* stream, int index, short, double* inVelocity, double* inInfluence,
                           double* outVelocity, double* outInfluence, unsigned char* clamped)
{
    return KFSp_Boundary([&] {
        return GetClamped(stream, index, {inVelocity, inInfluence}, {outVelocity, outInfluence}, clamped);
    });
}

int KFS_GetZeroVelocityPoints(KFS_Stream const* stream, int index, int dimensionIndex, int* count, T_Time* times,
                              double* secondDerivatives)
{
    return KFSp_Boundary(
        [&] { return GetZeroVelocityPoints(stream, index, dimensionIndex, count, times, secondDerivatives); });
}
