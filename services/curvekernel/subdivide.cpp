// De Casteljau's split.

#include "services/curvekernel/curve_private.h"

int CRV_SubdivideCurve(CRV_Curve const* curve, double* rows, double t)
{
    if (int const code = CRVp_CheckPath(curve)) return code;
    if (!rows) return CRV_Err_NullArgument;
    double const at = CRVp_LimitToUnit(t);
    if (at != at || !CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    int const dimension = curve->dimension;
    for (int i = 0; i < dimension; ++i) {
        double const leftOuter = CRVp_Between(curve->p0[i], curve->p1[i], at);
        double const middle = CRVp_Between(curve->p1[i], curve->p2[i], at);
        double const rightOuter = CRVp_Between(curve->p2[i], curve->p3[i], at);
        double const leftInner = CRVp_Between(leftOuter, middle, at);
        double const rightInner = CRVp_Between(middle, rightOuter, at);
        rows[i] = leftOuter;
        rows[dimension + i] = leftInner;
        rows[2 * dimension + i] = CRVp_Between(leftInner, rightInner, at);
        rows[3 * dimension + i] = rightInner;
        rows[4 * dimension + i] = rightOuter;
    }
    return 0;
}
