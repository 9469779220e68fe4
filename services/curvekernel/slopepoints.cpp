// Where y over x has a given slope.
//
// dy/dx = m asks for the roots of y'(t) - m x'(t), a quadratic in t whose Bernstein coefficients are the differences of
// y - m x along the control polygon. Where the first derivatives vanish together (an end whose handle has length zero)
// the quadratic has a root that says nothing about the slope there; the factor t or 1 - t is taken out first.

#include "services/curvekernel/curve_private.h"

#include <cmath>
#include <limits>

namespace {

constexpr double Scale = 0x1p-4;        // keeps differences of the largest doubles finite
constexpr double Vertical = 1e-12;      // dx/dt below this share of the segment counts as vertical
constexpr double SameParameter = 1e-9;  // a parameter this near to another is the same
constexpr double Touching = 1e-15;      // a discriminant this small, of coefficients up to 1, is a double root

// A polynomial of degree up to 2 in Bernstein form, first to last coefficient.
struct Bernstein {
    double c[3];
    int degree;

    void DivideByT()
    {
        // c[0] is 0: t times the polynomial of degree - 1 whose coefficients are c[i] degree / i.
        for (int i = 1; i <= degree; ++i) c[i - 1] = c[i] * degree / i;
        --degree;
    }
    void DivideByRest()
    {
        for (int i = 0; i < degree; ++i) c[i] = c[i] * degree / (degree - i);
        --degree;
    }
    bool IsZero() const
    {
        for (int i = 0; i <= degree; ++i)
            if (c[i] != 0.0) return false;
        return true;
    }
};

bool SamePoint(double const* a, double const* b)
{
    return a[0] == b[0] && a[1] == b[1];
}

// y - m x along the control polygon. What is no larger than the rounding of the coordinates is 0, so that an eased key
// has its point exactly at the key, and a straight segment has none.
Bernstein SlopeExcess(CRV_Curve const* curve, double m)
{
    double const* points[] = {curve->p0, curve->p1, curve->p2, curve->p3};
    double largest = 0.0;
    for (double const* point : points)
        largest = CRVp_Max(largest, Scale * std::fabs(point[1]) + Scale * std::fabs(m) * std::fabs(point[0]));
    double const rounding = 4.0 * std::numeric_limits<double>::epsilon() * largest;

    Bernstein excess{{}, 2};
    for (int i = 0; i < 3; ++i) {
        double const dx = Scale * points[i + 1][0] - Scale * points[i][0];
        double const dy = Scale * points[i + 1][1] - Scale * points[i][1];
        double const value = dy - m * dx;
        bool const exact = dy == 0.0 && (m == 0.0 || dx == 0.0);
        excess.c[i] = exact || std::fabs(value) <= rounding ? 0.0 : value;
    }
    return excess;
}

// The roots in 0 to 1, ends included, ascending, a double one once. The polynomial isn't zero everywhere.
int RootsInUnit(Bernstein const& polynomial, double roots[2])
{
    double a = 0.0;  // a t^2 + 2 b t + c
    double b = 0.0;
    double c = polynomial.c[0];
    if (polynomial.degree == 2) {
        b = polynomial.c[1] - polynomial.c[0];
        a = (polynomial.c[2] - polynomial.c[1]) - b;
    } else if (polynomial.degree == 1) {
        b = 0.5 * (polynomial.c[1] - polynomial.c[0]);
    }

    double found[2];
    int count = 0;
    double const largest = CRVp_Max(std::fabs(a), CRVp_Max(std::fabs(b), std::fabs(c)));
    a /= largest;
    b /= largest;
    c /= largest;
    double discriminant = b * b - a * c;
    if (std::fabs(discriminant) <= Touching) discriminant = 0.0;
    if (discriminant >= 0.0) {
        double const q = b < 0.0 ? std::sqrt(discriminant) - b : -(std::sqrt(discriminant) + b);
        if (q != 0.0) found[count++] = c / q;
        if (a != 0.0 && !(count == 1 && q / a == found[0])) found[count++] = q / a;
    }
    if (count == 2 && found[1] < found[0]) {
        double const swap = found[0];
        found[0] = found[1];
        found[1] = swap;
    }

    // An end is a root exactly if its coefficient is 0; rounding may have pushed that root out.
    int kept = 0;
    for (int i = 0; i < count; ++i) {
        double root = found[i];
        if (polynomial.c[0] == 0.0 && std::fabs(root) < SameParameter) root = 0.0;
        if (polynomial.c[polynomial.degree] == 0.0 && std::fabs(root - 1.0) < SameParameter) root = 1.0;
        if (root >= 0.0 && root <= 1.0) roots[kept++] = root;
    }
    return kept;
}

// Whether the curve, read as y over x, passes t, and not vertically.
bool HasSlopeAt(CRV_Curve const* curve, double t, bool atCusp)
{
    double const x0 = curve->p0[0];
    double const x1 = curve->p1[0];
    double const x2 = curve->p2[0];
    double const x3 = curve->p3[0];
    double const rest = 1.0 - t;
    double const out = Scale * x1 - Scale * x0;
    double const across = Scale * x2 - Scale * x1;
    double const in = Scale * x3 - Scale * x2;
    double const slope = 3.0 * (rest * rest * out + 2.0 * rest * t * across + t * t * in);
    if (!atCusp && !(std::fabs(slope) > Vertical * std::fabs(Scale * x3 - Scale * x0))) return false;
    double turns[2];
    if (CRVp_TurningPoints(x0, x1, x2, x3, turns) == 0) return true;
    double const reached = CRVp_Reach(x0, x1, x2, x3, CRVp_Blend(x0, x1, x2, x3, t));
    return std::fabs(reached - t) <= SameParameter;
}

}  // namespace

int CRV_EvaluateXFromYPrime(CRV_Curve const* curve, int* count, double* xs, double yPrime)
{
    if (count) *count = 0;
    if (int const code = CRVp_CheckGraph(curve)) return code;
    if (!count || !xs) return CRV_Err_NullArgument;
    if (!CRVp_AllFinite(curve) || !CRVp_IsFinite(yPrime)) return CRV_Err_NotFinite;
    if (curve->p0[0] == curve->p3[0]) return 0;

    Bernstein excess = SlopeExcess(curve, yPrime);
    bool const startIsCusp = SamePoint(curve->p0, curve->p1);
    bool const endIsCusp = SamePoint(curve->p2, curve->p3);
    if (startIsCusp) excess.DivideByT();
    if (endIsCusp) excess.DivideByRest();
    bool const middleIsPoint = SamePoint(curve->p1, curve->p2);
    if (middleIsPoint && startIsCusp && !endIsCusp) excess.DivideByT();
    if (middleIsPoint && endIsCusp && !startIsCusp) excess.DivideByRest();
    if (excess.IsZero()) return 0;

    double roots[2];
    int const found = RootsInUnit(excess, roots);
    int kept = 0;
    for (int i = 0; i < found; ++i) {
        bool const atCusp = (startIsCusp && roots[i] == 0.0) || (endIsCusp && roots[i] == 1.0);
        if (!HasSlopeAt(curve, roots[i], atCusp)) continue;
        double const x = CRVp_LimitToHull(curve->p0[0], curve->p1[0], curve->p2[0], curve->p3[0],
                                          CRVp_Blend(curve->p0[0], curve->p1[0], curve->p2[0], curve->p3[0], roots[i]));
        if (kept == 1 && x == xs[0]) continue;
        xs[kept++] = x;
    }
    if (kept == 2 && xs[1] < xs[0]) {
        double const swap = xs[0];
        xs[0] = xs[1];
        xs[1] = swap;
    }
    *count = kept;
    return 0;
}
