// The only place where the library reaches into its own services instead of asking them: the items of a list, the
// kernel's solve and the thread's render context, which a read can't afford to call. That ties libkfs to these services,
// and KFS_Birth refuses others. Built with KFS_FOREIGN_SERVICES the library asks for everything, and any services will do:
// each function here then has nothing to give, and its caller takes the way through the operations, with the same answers.
//
// All of it is inlined always: a test links objects of both builds, and must not get one's function for the other.
#pragma once

#include "frame/services/context.h"
#include "frame/services/sequence.h"

#ifdef KFS_FOREIGN_SERVICES
inline constexpr bool KFSp_HasShortcuts = false;
#else
#include "services/curvekernel/solve_private.h"
#include "services/sequence/list_private.h"
#include "services/utility/context_private.h"
inline constexpr bool KFSp_HasShortcuts = true;
#endif

// Q_RenderContext::PeekCurrent.
[[gnu::always_inline]] inline Q_RenderContext const* KFSp_PeekRenderContext()
{
#ifdef KFS_FOREIGN_SERVICES
    return Q_RenderContext::PeekCurrent();
#else
    return Qp_currentRenderContext;
#endif
}

// Two neighbours of a list, read-only, without a call: there is an item at `index` and one after it. A list whose items
// may move has to be pinned while both are looked at. Null where the list can't be read.
struct KFSp_ItemPair {
    void const* first = nullptr;
    void const* second = nullptr;
};
[[gnu::always_inline]] inline KFSp_ItemPair KFSp_GetItemPair(SEQ_Head const* const* list, int index)
{
#ifdef KFS_FOREIGN_SERVICES
    KFSp_ItemPair pair;
    bool const found =
        SEQ_GetConstAddress(list, index, &pair.first) == 0 && SEQ_GetConstAddress(list, index + 1, &pair.second) == 0;
    return found ? pair : KFSp_ItemPair{};
#else
    unsigned char const* const first = SEQp_Item(**list, index);
    return {first, first + (*list)->stride};
#endif
}

// Room for `count` items behind the last one of a list of plain bytes, where there is some already; null where items have
// to go in through the operations. What is written there isn't the list's before KFSp_TakeRoom.
[[gnu::always_inline]] inline unsigned char* KFSp_GetRoom([[maybe_unused]] SEQ_Head** list, [[maybe_unused]] int count)
{
#ifdef KFS_FOREIGN_SERVICES
    return nullptr;
#else
    SEQ_Head const& head = **list;
    return head.capacity - head.count >= count && !head.copy && !head.dispose ? SEQp_Item(head, head.count) : nullptr;
#endif
}
[[gnu::always_inline]] inline void KFSp_TakeRoom(SEQ_Head** list, int count)
{
    (*list)->count += count;
}

// Takes away the last item of a list of plain bytes. False where that has to be asked for.
[[gnu::always_inline]] inline bool KFSp_DropLastItem([[maybe_unused]] SEQ_Head** list)
{
#ifdef KFS_FOREIGN_SERVICES
    return false;
#else
    if ((*list)->dispose) return false;
    --(*list)->count;
    return true;
#endif
}

// An item of a list that has one at `index`, read-only, without a call. Null where the list can't be read.
[[gnu::always_inline]] inline void const* KFSp_GetItem(SEQ_Head const* const* list, int index)
{
#ifdef KFS_FOREIGN_SERVICES
    void const* item = nullptr;
    return SEQ_GetConstAddress(list, index, &item) == 0 ? item : nullptr;
#else
    return SEQp_Item(**list, index);
#endif
}

// What CRV_EvaluateYFromX answers at the share `u` of a segment, whose handles lie at the influences `out` and `in` from
// its ends and have the heights y1 and y2. False, and `value` untouched, where the curve has to be built and asked.
[[gnu::always_inline]] inline bool KFSp_SolveUnitSegment([[maybe_unused]] double out, [[maybe_unused]] double in,
                                                         [[maybe_unused]] double u, [[maybe_unused]] double y0,
                                                         [[maybe_unused]] double y1, [[maybe_unused]] double y2,
                                                         [[maybe_unused]] double y3, [[maybe_unused]] double* value)
{
#ifdef KFS_FOREIGN_SERVICES
    return false;
#else
    double t = 0.0;
    if (!CRVp_UnitRoot(out, 1.0 - in, u, t)) [[unlikely]]
        return false;
    double const found = CRVp_Blend(y0, y1, y2, y3, t);
    if (!CRVp_IsFinite(found)) [[unlikely]]
        return false;
    *value = CRVp_LimitToHull(y0, y1, y2, y3, found);
    return true;
#endif
}

// Whether a curve is known to rise from y0 to y3, so that CRV_CurveSetNonDecreasing would leave it as it is.
[[gnu::always_inline]] inline bool KFSp_IsKnownToRise([[maybe_unused]] double y0, [[maybe_unused]] double y1,
                                                      [[maybe_unused]] double y2, [[maybe_unused]] double y3)
{
#ifdef KFS_FOREIGN_SERVICES
    return false;
#else
    return CRVp_IsInside(y0, y1, y2, y3);
#endif
}

// One coordinate of what CRV_EvaluatePoint answers. False where it has to be asked.
[[gnu::always_inline]] inline bool KFSp_EvaluateCoordinate([[maybe_unused]] double c0, [[maybe_unused]] double c1,
                                                           [[maybe_unused]] double c2, [[maybe_unused]] double c3,
                                                           [[maybe_unused]] double t, [[maybe_unused]] double* value)
{
#ifdef KFS_FOREIGN_SERVICES
    return false;
#else
    double const found = CRVp_Blend(c0, c1, c2, c3, CRVp_LimitToUnit(t));
    if (!CRVp_IsFinite(found)) [[unlikely]]
        return false;
    *value = CRVp_LimitToHull(c0, c1, c2, c3, found);
    return true;
#endif
}
