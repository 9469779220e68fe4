// Slopes of y over x.
//
// All of them come from the derivatives by t, built on the differences of neighbouring control points: where a handle
// has length zero the vanishing term is an exact zero, and the quotients next to it keep their digits.

#include "services/curvekernel/curve_private.h"

#include <cmath>
#include <limits>

namespace {

constexpr double Largest = std::numeric_limits<double>::max();

// dx/dt below this share of the segment counts as vertical.
constexpr double VerticalSlope = 1e-12;

// Differences of the largest doubles, and six times those, must stay finite.
constexpr double Scale = 0x1p-6;

// The derivatives of one coordinate by t, scaled by Scale.
struct Derivatives {
    double first, second, third;
    double extent;  // the largest step between neighbouring control coordinates, scaled alike

    Derivatives(double c0, double c1, double c2, double c3, double t)
    {
        double const out = Scale * c1 - Scale * c0;
        double const across = Scale * c2 - Scale * c1;
        double const in = Scale * c3 - Scale * c2;
        double const rest = 1.0 - t;
        first = 3.0 * (rest * rest * out + 2.0 * rest * t * across + t * t * in);
        second = 6.0 * (rest * (across - out) + t * (in - across));
        third = 6.0 * ((in - across) - (across - out));
        extent = CRVp_Max(std::fabs(out), CRVp_Max(std::fabs(across), std::fabs(in)));
    }
};

// A segment at one parameter, ready for quotients.
struct Place {
    double t;
    Derivatives x, y;
    double vertical;  // the smallest dx/dt that is divided by, with the sign of the segment

    bool HasNoDirection() const
    {
        return std::fabs(x.first) <= std::fabs(vertical) && std::fabs(y.first) <= VerticalSlope * y.extent;
    }
    double SafeFirst() const { return std::fabs(x.first) <= std::fabs(vertical) ? vertical : x.first; }
};

double LimitToDoubles(double value)
{
    return value > Largest ? Largest : value < -Largest ? -Largest : value;
}

// The slope where the first derivatives vanish together: that of the tangent on the curve's further side.
double SlopeOfCusp(Place const& place)
{
    double const floor = std::fabs(place.vertical);
    if (std::fabs(place.x.second) > floor) return place.y.second / place.x.second;
    if (std::fabs(place.y.second) > VerticalSlope * place.y.extent) {
        // Vertical again. Leaving the start, and coming to the end, x and t grow together.
        return place.y.second / (place.t < 1.0 ? place.vertical : -place.vertical);
    }
    return std::fabs(place.x.third) > floor ? place.y.third / place.x.third : 0.0;
}

double Slope(Place const& place)
{
    return LimitToDoubles(place.HasNoDirection() ? SlopeOfCusp(place) : place.y.first / place.SafeFirst());
}

// Finds the place of x and hands it to `answer`, whose result is the operation's answer.
template <class Answer>
int AtPlaceOf(CRV_Curve const* curve, double* result, double x, Answer&& answer)
{
    if (int const code = CRVp_CheckGraph(curve)) return code;
    if (!result) return CRV_Err_NullArgument;
    if (!CRVp_AllFinite(curve) || x != x) return CRV_Err_NotFinite;

    double const x0 = curve->p0[0];
    double const x1 = curve->p1[0];
    double const x2 = curve->p2[0];
    double const x3 = curve->p3[0];
    if (x0 == x3) {
        *result = 0.0;
        return 0;
    }
    double const t = CRVp_Reach(x0, x1, x2, x3, x);
    double const vertical = VerticalSlope * (Scale * x3 - Scale * x0);
    double const smallest = std::numeric_limits<double>::min();
    Place const place{t,
                      {x0, x1, x2, x3, t},
                      {curve->p0[1], curve->p1[1], curve->p2[1], curve->p3[1], t},
                      std::fabs(vertical) < smallest ? (x3 < x0 ? -smallest : smallest) : vertical};
    *result = answer(place);
    return 0;
}

}  // namespace

int CRV_Evaluate1dDerivFromX(CRV_Curve const* curve, double* dydx, double x)
{
    return AtPlaceOf(
        curve, dydx, x, [](Place const& place) { return Slope(place); });
}

int CRV_Evaluate1dDeriv2FromX(CRV_Curve const* curve, double* d2ydx2, double x)
{
    return AtPlaceOf(
        curve, d2ydx2, x,
        [](Place const& place) {
            if (place.HasNoDirection()) return 0.0;
            // (x' y'' - y' x'') / x'^3, one division at a time so that nothing underflows to 0 / 0. The coordinates' scale
            // cancels in the slope but not in 1 / x', hence the factor.
            double const bend = place.y.second - Slope(place) * place.x.second;
            return LimitToDoubles(bend / place.SafeFirst() / place.SafeFirst() * Scale);
        });
}
