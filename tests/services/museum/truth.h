// What the curve kernel should answer, worked out the plain way in fifty digits. Parameters may be any t of a curve;
// results are rounded to long double.
#pragma once

#include "tests/services/museum/museum.h"

#include <vector>

namespace truth {

using Real = long double;

Real At(Curve const& curve, std::size_t i, Real t);
Real FirstAt(Curve const& curve, std::size_t i, Real t);  // derivatives by t
Real SecondAt(Curve const& curve, std::size_t i, Real t);

// The five inner points of the curve split at t, in order, by de Casteljau.
std::array<std::array<Real, 4>, 5> Split(Curve const& curve, Real t);

// The smallest t at which coordinate i, on its way from p0 to p3, reaches the value.
Real FirstReach(Curve const& curve, std::size_t i, Real value);

// The furthest that x has come towards p3 anywhere from 0 to t, p3 at most.
Real FurthestX(Curve const& curve, Real t);

// How far y falls back behind its height so far on the way from p0 to p3.
Real FallsBack(Curve const& curve);

// The parameters, in [0, 1] and ascending, at which dy = slope * dx, and the least distance between the two roots where
// they are two, real or not.
struct SlopePlaces {
    std::vector<Real> ts;
    Real apart;
};
SlopePlaces PlacesOfSlope(Curve const& curve, Real slope);

// Lengths of a path to 1e-13 of the polygon's, by Gauss's five points on ever smaller stretches that begin where the path
// is slowest.
class Ruler {
public:
    explicit Ruler(Curve const& curve);
    Real Length(Real from, Real to) const;

    Real polygon = 0;

private:
    Real Rule(Real from, Real to) const;
    Real Refined(Real from, Real to, Real whole, int depth) const;

    std::vector<std::array<Real, 4>> coordinates_;
    std::vector<Real> slowest_;
};

}  // namespace truth
