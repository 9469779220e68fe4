// What all operations on a CRV_Curve begin with.
#pragma once

#include "frame/services/curvekernel.h"
#include "services/curvekernel/solve_private.h"

#include <initializer_list>

// The points hold at most this many coordinates anywhere.
inline constexpr int CRVp_MostCurveDimensions = 4;

inline bool CRVp_HasPoints(CRV_Curve const* curve)
{
    return curve && curve->p0 && curve->p1 && curve->p2 && curve->p3;
}

// 0, or why the curve can't be read as y over x.
[[nodiscard]] inline int CRVp_CheckGraph(CRV_Curve const* curve)
{
    if (!CRVp_HasPoints(curve)) return CRV_Err_NullArgument;
    return curve->dimension == 2 ? 0 : CRV_Err_Dimension;
}

// 0, or why the curve can't be read as a path.
[[nodiscard]] inline int CRVp_CheckPath(CRV_Curve const* curve)
{
    if (!CRVp_HasPoints(curve)) return CRV_Err_NullArgument;
    return curve->dimension >= 1 && curve->dimension <= CRVp_MostCurveDimensions ? 0 : CRV_Err_Dimension;
}

inline bool CRVp_AllFinite(CRV_Curve const* curve)
{
    for (double const* point : {curve->p0, curve->p1, curve->p2, curve->p3})
        for (int i = 0; i < curve->dimension; ++i)
            if (!CRVp_IsFinite(point[i])) return false;
    return true;
}

// Between a and b at share t, exact at both ends and where the two are equal, without overflow.
inline double CRVp_Between(double a, double b, double t)
{
    double const value = (1.0 - t) * a + t * b;
    return CRVp_Max(CRVp_Min(a, b), CRVp_Min(CRVp_Max(a, b), value));
}
