// Places on a curve: by abscissa, by ordinate, by parameter.

#include "services/curvekernel/curve_private.h"

int CRV_EvaluateYFromX(CRV_Curve const* curve, double* y, double x)
{
    if (int const code = CRVp_CheckGraph(curve)) return code;
    if (!y) return CRV_Err_NullArgument;

    double const t = CRVp_Reach(curve->p0[0], curve->p1[0], curve->p2[0], curve->p3[0], x);
    double const y0 = curve->p0[1];
    double const y1 = curve->p1[1];
    double const y2 = curve->p2[1];
    double const y3 = curve->p3[1];
    double const value = CRVp_Blend(y0, y1, y2, y3, t);

    // Rounding can carry a blend of the largest doubles over the top; only a coordinate can make it wrong.
    if (!CRVp_IsFinite(value) && (t != t || !CRVp_AllFinite(curve))) return CRV_Err_NotFinite;
    *y = CRVp_LimitToHull(y0, y1, y2, y3, value);
    return 0;
}

int CRV_TFromX(CRV_Curve const* curve, double* t, double x)
{
    if (!CRVp_HasPoints(curve) || !t) return CRV_Err_NullArgument;
    if (curve->dimension < 1) return CRV_Err_Dimension;

    double const found = CRVp_Reach(curve->p0[0], curve->p1[0], curve->p2[0], curve->p3[0], x);
    if (found != found) return CRV_Err_NotFinite;
    *t = found;
    return 0;
}

int CRV_EvaluateXFromY(CRV_Curve const* curve, double* x, double y)
{
    if (int const code = CRVp_CheckGraph(curve)) return code;
    if (!x) return CRV_Err_NullArgument;
    if (!CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    double const t = CRVp_Reach(curve->p0[1], curve->p1[1], curve->p2[1], curve->p3[1], y);
    if (t != t) return CRV_Err_NotFinite;

    double const x0 = curve->p0[0];
    double const x1 = curve->p1[0];
    double const x2 = curve->p2[0];
    double const x3 = curve->p3[0];
    double found = CRVp_Blend(x0, x1, x2, x3, t);

    // Where x has turned back before t, y is reached in the jump, at the furthest x so far.
    double turns[2];
    int const count = CRVp_TurningPoints(x0, x1, x2, x3, turns);
    for (int i = 0; i < count && turns[i] < t; ++i) {
        double const turn = CRVp_Blend(x0, x1, x2, x3, turns[i]);
        found = x0 <= x3 ? CRVp_Max(found, turn) : CRVp_Min(found, turn);
    }
    *x = CRVp_Max(CRVp_Min(x0, x3), CRVp_Min(CRVp_Max(x0, x3), found));
    return 0;
}

int CRV_EvaluatePoint(CRV_Curve const* curve, double* point, double t)
{
    if (int const code = CRVp_CheckPath(curve)) return code;
    if (!point) return CRV_Err_NullArgument;
    double const at = CRVp_LimitToUnit(t);
    if (at != at || !CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    for (int i = 0; i < curve->dimension; ++i) {
        double const value = CRVp_Blend(curve->p0[i], curve->p1[i], curve->p2[i], curve->p3[i], at);
        point[i] = CRVp_LimitToHull(curve->p0[i], curve->p1[i], curve->p2[i], curve->p3[i], value);
    }
    return 0;
}

int CRV_EvaluateDeriv(CRV_Curve const* curve, double* vector, double t)
{
    if (int const code = CRVp_CheckPath(curve)) return code;
    if (!vector) return CRV_Err_NullArgument;
    double const at = CRVp_LimitToUnit(t);
    if (at != at || !CRVp_AllFinite(curve)) return CRV_Err_NotFinite;

    double const rest = 1.0 - at;
    double found[CRVp_MostCurveDimensions] = {};
    for (int i = 0; i < curve->dimension; ++i) {
        double const out = curve->p1[i] - curve->p0[i];
        double const across = curve->p2[i] - curve->p1[i];
        double const in = curve->p3[i] - curve->p2[i];
        found[i] = 3.0 * (rest * rest * out + 2.0 * rest * at * across + at * at * in);
        if (!CRVp_IsFinite(found[i])) return CRV_Err_NotFinite;
    }
    for (int i = 0; i < curve->dimension; ++i) vector[i] = found[i];
    return 0;
}
