// The table as a list.

#include "services/curvekernel/arctable_private.h"

#include "services/curvekernel/curve_private.h"
#include "services/sequence/list_private.h"

#include <cstring>

namespace {

// What the table's list holds, read by address: the items have no gaps. Null for a list of anything else.
double const* WordsOf(SEQ_Head const* const* list)
{
    if (!SEQp_IsList(list)) return nullptr;
    SEQ_Head const& head = **list;
    if (head.itemSize != sizeof(CRVp_ArcItem) || head.count < CRVp_FewestArcItems) return nullptr;
    return reinterpret_cast<double const*>(head.items);
}

// Whether the list's table was made of the same curve with the same accuracy.
bool IsTableOf(SEQ_Head const* const* list, CRVp_ArcMeasured const& measured)
{
    double const* const words = WordsOf(list);
    if (!words) return false;
    return std::memcmp(words, &measured.scale, sizeof measured.scale) == 0 &&
           std::memcmp(words + 4 * (*list)->count - CRVp_ArcInputs, measured.inputs, sizeof measured.inputs) == 0;
}

// Puts the table into the list, which may be null, or into a new one where it doesn't fit or leaves half of it empty. On
// failure the list is what it was.
int PutIntoList(CRVp_ArcTable const& table, SEQ_Head**& list)
{
    bool const fits = list && WordsOf(list) && (*list)->capacity >= table.items && (*list)->capacity <= 2 * table.items;
    SEQ_Head** into = list;
    int const code =
        fits ? SEQ_SetNumItems(table.items, list, 0) : SEQp_NewInOneBlock(sizeof(CRVp_ArcItem), table.items, &into);
    if (code != 0) return code;
    std::memcpy((*into)->items, table.words, static_cast<std::size_t>(table.items) * sizeof(CRVp_ArcItem));
    if (list && into != list) static_cast<void>(SEQ_Dispose(list, 0));  // plain bytes, which refuse nothing
    list = into;
    return 0;
}

void GiveUp(SEQ_Head**& list)
{
    if (list) static_cast<void>(SEQ_Dispose(list, 0));  // what made it give up wins
    list = nullptr;
}

}  // namespace

double CRVp_TNextToStandstill(CRVp_ArcKnot const& from, CRVp_ArcKnot const& to, double length, double r)
{
    if (from.slope < 0.0) return CRVp_RootQuintic(from, to, length, 1.0).At(std::sqrt(r));
    return CRVp_RootQuintic(to, from, length, -1.0).At(std::sqrt(r < 1.0 ? 1.0 - r : 0.0));
}

int CRV_BuildArcSpline(CRV_Curve const* curve, SEQ_Head*** remapTable, double* arcLength, double accuracy)
{
    if (!remapTable || !arcLength) return CRV_Err_NullArgument;
    CRVp_ArcMeasured measured;
    int code = CRVp_PrepareArc(curve, accuracy, measured);
    if (code == 0 && *remapTable && IsTableOf(*remapTable, measured)) {
        *arcLength = CRVp_ArcLength(WordsOf(*remapTable), (**remapTable)->count);
        return 0;
    }
    CRVp_ArcTable table;
    if (code == 0) code = CRVp_MeasureArc(measured, table);
    if (code == 0) code = PutIntoList(table, *remapTable);
    if (code != 0) GiveUp(*remapTable);
    *arcLength = code == 0 ? table.length : 0.0;
    return code;
}

int CRV_TFromSSpline(CRV_Curve const* curve, SEQ_Head*** remapTable, double* t, double s, double one)
{
    if (!remapTable || !t) return CRV_Err_NullArgument;
    if (s != s || !CRVp_IsFinite(one)) return CRV_Err_NotFinite;

    if (*remapTable) {
        double const* const words = WordsOf(*remapTable);
        if (!words) return SEQ_Err_BadList;
        *t = one * CRVp_TAtDistance(words, (**remapTable)->count, s);
        return 0;
    }

    CRVp_ArcMeasured measured;
    CRVp_ArcTable table;
    if (int const code = CRVp_PrepareArc(curve, 0.0, measured)) return code;
    if (int const code = CRVp_MeasureArc(measured, table)) return code;
    *t = one * CRVp_TAtDistance(table.words, table.items, s);
    return 0;
}
