// Many temporal segments at once: apart, because it is compiled for several instruction sets.
//
// A lane is the common case of KFSp_InterpolateBetween, by the same functions in the same order, without a branch. So the
// compiler makes vector code of it, and each operation on a vector rounds as the one on a number does: the bits are the
// same whatever the machine has. Nothing here may be fused or reordered.
#include "keystore/curvehooks_private.h"

#include "curves/segment_private.h"
#include "keystore/shortcuts_private.h"

#include <cmath>

#if !defined(KFS_FOREIGN_SERVICES)

namespace {

constexpr int Group = 8;  // lanes of a vector or two
static_assert(KFSp_SplineLanes::Count % Group == 0);

[[gnu::always_inline]] inline void SolveLane(KFSp_SplineLanes& lanes, int i)
{
    double const dt = lanes.span[i] / lanes.scale[i];
    double const u = lanes.part[i] / lanes.span[i];
    KFSp_TemporalEnd const first{lanes.value0[i], lanes.outSpeed[i], lanes.outInfluence[i], true};
    KFSp_TemporalEnd const last{lanes.value3[i], lanes.inSpeed[i], lanes.inInfluence[i], true};
    KFSp_TemporalHandles const handles = KFSp_GetTemporalHandles(first, last, dt);

    CRVp_UnitAnswer const root = CRVp_UnitRootInLane(first.influence, 1.0 - last.influence, u);
    double const found = CRVp_Blend(first.value, handles.y1, handles.y2, last.value, root.t);
    lanes.result[i] = CRVp_LimitToHull(first.value, handles.y1, handles.y2, last.value, found);
    lanes.solved[i] = CRVp_IsFinite(found) ? root.isRoot : 0.0;
}

[[gnu::always_inline]] inline void SolveLanes(KFSp_SplineLanes& lanes, int count)
{
    for (int begin = 0; begin < count; begin += Group)
        for (int i = begin; i < begin + Group; ++i) SolveLane(lanes, i);
}

#if defined(__x86_64__)
[[gnu::target("avx2")]] void SolveWithAvx2(KFSp_SplineLanes& lanes, int count)
{
    SolveLanes(lanes, count);
}
#endif

void SolveWithBase(KFSp_SplineLanes& lanes, int count)
{
    SolveLanes(lanes, count);
}

using Solver = void (*)(KFSp_SplineLanes& lanes, int count);

Solver ChooseSolver()
{
#if defined(__x86_64__)
    if (__builtin_cpu_supports("avx2")) return SolveWithAvx2;
#endif
    return SolveWithBase;
}

}  // namespace

void KFSp_SolveSplineLanes(KFSp_SplineLanes* lanes, int count)
{
    static Solver const solve = ChooseSolver();
    solve(*lanes, count);
}

#else

// Only reads that reach into the list fill lanes.
void KFSp_SolveSplineLanes(KFSp_SplineLanes*, int) {}

#endif
