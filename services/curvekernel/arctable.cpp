// The table as a list.
//
// The pieces are read by address: the list service keeps its items in one block without gaps.

#include "services/curvekernel/arctable_private.h"

#include "frame/services/sequence.h"
#include "services/curvekernel/curve_private.h"

#include <cstring>

namespace {

// Makes a list of the table's pieces. On failure nothing is left.
int MakeList(CRVp_ArcTable const& table, SEQ_Head**& made)
{
    SEQ_Head** list = nullptr;
    if (const int code = SEQ_New(0, sizeof(CRVp_ArcPiece), 4, 1, &list)) return code;
    int code = SEQ_ReserveSpace(table.count, list);
    if (code == 0) code = SEQ_SetNumItems(table.count, list, 0);
    void* items = nullptr;
    if (code == 0) code = SEQ_GetAddress(list, 0, 0, &items);
    if (code != 0) {
        SEQ_Dispose(list, 0);
        return code;
    }
    std::memcpy(items, table.pieces, static_cast<std::size_t>(table.count) * sizeof(CRVp_ArcPiece));
    made = list;
    return 0;
}

}  // namespace

int CRV_BuildArcSpline(CRV_Curve const* curve, SEQ_Head*** remapTable, double* arcLength, double accuracy)
{
    if (!remapTable || !arcLength) return CRV_Err_NullArgument;
    if (*remapTable) SEQ_Dispose(*remapTable, 0);
    *remapTable = nullptr;
    *arcLength = 0.0;

    CRVp_ArcTable table;
    int code = CRVp_MeasureArc(curve, accuracy, table);
    if (code == 0) code = MakeList(table, *remapTable);
    if (code == 0) *arcLength = table.length;
    return code;
}

int CRV_TFromSSpline(CRV_Curve const* curve, SEQ_Head*** remapTable, double* t, double s, double one)
{
    if (!remapTable || !t) return CRV_Err_NullArgument;
    if (s != s || !CRVp_IsFinite(one)) return CRV_Err_NotFinite;

    if (*remapTable) {
        void const* pieces = nullptr;
        if (const int code = SEQ_GetConstAddress(*remapTable, 0, &pieces)) return code;
        *t = one * CRVp_TAtDistance(static_cast<CRVp_ArcPiece const*>(pieces), (**remapTable)->count, s);
        return 0;
    }

    CRVp_ArcTable table;
    if (const int code = CRVp_MeasureArc(curve, 0.0, table)) return code;
    *t = one * CRVp_TAtDistance(table.pieces, table.count, s);
    return 0;
}
