// De Casteljau's split.

#include "services/curvekernel/curve_private.h"

int CRV_SubdivideCurve(CRV_Curve const* curve, double* rows, double t)
{
    if (const int code = CRVp_CheckPath(curve)) return code;
    if (!rows) return CRV_Err_NullArgument;
    const double at = CRVp_LimitToUnit(t);
    if (at != at || !CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    const int dimension = curve->dimension;
    for (int i = 0; i < dimension; ++i) {
        const double leftOuter = CRVp_Between(curve->p0[i], curve->p1[i], at);
        const double middle = CRVp_Between(curve->p1[i], curve->p2[i], at);
        const double rightOuter = CRVp_Between(curve->p2[i], curve->p3[i], at);
        const double leftInner = CRVp_Between(leftOuter, middle, at);
        const double rightInner = CRVp_Between(middle, rightOuter, at);
        rows[i] = leftOuter;
        rows[dimension + i] = leftInner;
        rows[2 * dimension + i] = CRVp_Between(leftInner, rightInner, at);
        rows[3 * dimension + i] = rightInner;
        rows[4 * dimension + i] = rightOuter;
    }
    return 0;
}
