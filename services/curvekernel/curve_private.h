// What all operations on a CRV_Curve begin with.
#pragma once

#include "frame/services/curvekernel.h"
#include "services/curvekernel/solve_private.h"

#include <initializer_list>

// The points hold at most this many coordinates anywhere.
inline constexpr int KFSp_MostCurveDimensions = 4;

inline bool KFSp_HasPoints(CRV_Curve const* curve)
{
    return curve && curve->p0 && curve->p1 && curve->p2 && curve->p3;
}

// 0, or why the curve can't be read as y over x.
inline int KFSp_CheckGraph(CRV_Curve const* curve)
{
    if (!KFSp_HasPoints(curve)) return CRV_Err_NullArgument;
    return curve->dimension == 2 ? 0 : CRV_Err_Dimension;
}

// 0, or why the curve can't be read as a path.
inline int KFSp_CheckPath(CRV_Curve const* curve)
{
    if (!KFSp_HasPoints(curve)) return CRV_Err_NullArgument;
    return curve->dimension >= 1 && curve->dimension <= KFSp_MostCurveDimensions ? 0 : CRV_Err_Dimension;
}

inline bool KFSp_AllFinite(CRV_Curve const* curve)
{
    for (double const* point : {curve->p0, curve->p1, curve->p2, curve->p3})
        for (int i = 0; i < curve->dimension; ++i)
            if (!KFSp_IsFinite(point[i])) return false;
    return true;
}

// NaN stays NaN.
inline double KFSp_LimitToUnit(double t)
{
    return t < 0.0 ? 0.0 : t > 1.0 ? 1.0 : t;
}

// Between a and b at share t, exact at both ends and where the two are equal, without overflow.
inline double KFSp_Between(double a, double b, double t)
{
    const double value = (1.0 - t) * a + t * b;
    return KFSp_Max(KFSp_Min(a, b), KFSp_Min(KFSp_Max(a, b), value));
}
