// Slopes of y over x, and the places where there is a given one.

#include "curvekernel_truth.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <limits>
#include <vector>

namespace {

using truth::Curve;
using truth::Dice;
using truth::Graph;
using truth::Real;

constexpr double NaN = std::numeric_limits<double>::quiet_NaN();

double Slope(Curve curve, double x)
{
    CRV_Curve const kernel = curve.Get();
    double slope = NaN;
    EXPECT_EQ(0, CRV_Evaluate1dDerivFromX(&kernel, &slope, x));
    return slope;
}

double Bend(Curve curve, double x)
{
    CRV_Curve const kernel = curve.Get();
    double bend = NaN;
    EXPECT_EQ(0, CRV_Evaluate1dDeriv2FromX(&kernel, &bend, x));
    return bend;
}

std::vector<double> Points(Curve curve, double slope)
{
    CRV_Curve const kernel = curve.Get();
    double xs[3] = {NaN, NaN, 77.0};
    int count = -1;
    EXPECT_EQ(0, CRV_EvaluateXFromYPrime(&kernel, &count, xs, slope));
    EXPECT_EQ(77.0, xs[2]);
    EXPECT_TRUE(count >= 0 && count <= 2) << count;
    return {xs, xs + std::clamp(count, 0, 2)};
}

TEST(CurveKernelSlope, AgreesWithTheQuotientsOfTheDerivatives)
{
    Dice dice(31);
    for (int i = 0; i < 20000; ++i) {
        Curve const curve = Graph(dice.Between(0.1, 5), dice.Between(0.05, 0.9), dice.Between(0.05, 0.9),
                                  dice.Between(-5, 5), dice.Between(-5, 5), dice.Between(-5, 5), dice.Between(-5, 5));
        double const x = dice.Between(0, curve.p[3][0]);
        Real const t = truth::FirstReach(curve, 0, x, 1);
        Real const dx = truth::FirstAt(curve, 0, t);
        if (dx < 0.05L * curve.p[3][0]) continue;
        Real const dy = truth::FirstAt(curve, 1, t);
        Real const bend = (dx * truth::SecondAt(curve, 1, t) - dy * truth::SecondAt(curve, 0, t)) / (dx * dx * dx);
        EXPECT_NEAR(static_cast<double>(dy / dx), Slope(curve, x), 1e-8 * (1 + std::fabs(static_cast<double>(dy / dx))))
            << curve << " at " << x;
        EXPECT_NEAR(static_cast<double>(bend), Bend(curve, x), 1e-6 * (1 + std::fabs(static_cast<double>(bend))))
            << curve << " at " << x;
    }
}

TEST(CurveKernelSlope, WhereTheCurveStandsStillTheLimitAnswers)
{
    const struct {
        char const* why;
        Curve curve;
        double x, slope;
    } rows[] = {
        {"no out handle: towards the in handle's end", Graph(2, 0, 0.5, 10, 10, 16, 20), 0, 6},
        {"no in handle: from the out handle's end", Graph(2, 0.5, 0, 10, 12, 20, 20), 2, 8},
        {"no handles at all: the chord, at the start", Graph(2, 0, 0, 10, 10, 20, 20), 0, 5},
        {"no handles at all: the chord, at the end", Graph(2, 0, 0, 10, 10, 20, 20), 2, 5},
        {"no handles at all: the chord, between", Graph(2, 0, 0, 10, 10, 20, 20), 0.7, 5},
        {"both handles at the start", Graph(2, 0, 1, 10, 10, 10, 20), 0, 5},
        {"both handles at the end", Graph(2, 1, 0, 10, 20, 20, 20), 2, 5},
        {"an eased end", Graph(2, 0.4, 0.4, 10, 10, 20, 20), 2, 0},
        {"an S with both handles at the middle of a line", Graph(2, 0.5, 0.5, 10, 15, 15, 20), 1, 5},
        {"before the start, the start's", Graph(2, 0.5, 0.5, 10, 13, 20, 20), -4, 3},
        {"after the end, the end's", Graph(2, 0.5, 0.5, 10, 10, 18, 20), 9, 2},
    };
    for (auto const& row : rows) EXPECT_NEAR(row.slope, Slope(row.curve, row.x), 1e-9) << row.why;
}

TEST(CurveKernelSlope, VerticalTangentsAreLargeFiniteAndOfTheRightSign)
{
    const struct {
        char const* why;
        Curve curve;
        double x;
        int sign;
    } rows[] = {
        {"up at the start", Graph(2, 0, 0.3, 10, 25, 20, 20), 0, 1},
        {"down at the start", Graph(2, 0, 0.3, 10, 5, 20, 20), 0, -1},
        {"up at the end", Graph(2, 0.3, 0, 10, 10, -5, 20), 2, 1},
        {"down at the end", Graph(2, 0.3, 0, 10, 10, 25, 20), 2, -1},
        {"a plateau of x in the middle", Graph(2, 1, 1, 10, 10, 20, 20), 1, 1},
        {"the same, falling", Graph(2, 1, 1, 20, 20, 10, 10), 1, -1},
        {"values near the largest double", Graph(2, 0, 0.3, -1e308, 1e308, 1e308, 1e308), 0, 1},
    };
    for (auto const& row : rows) {
        double const slope = Slope(row.curve, row.x);
        EXPECT_TRUE(std::isfinite(slope) && slope * row.sign > 1e6) << row.why << ": " << slope;
        EXPECT_TRUE(std::isfinite(Bend(row.curve, row.x))) << row.why;
    }
}

TEST(CurveKernelSlope, AnyFiniteCurveHasFiniteSlopes)
{
    Dice dice(32);
    for (int i = 0; i < 20000; ++i) {
        Curve curve;
        for (auto& point : curve.p)
            for (std::size_t k = 0; k < 2; ++k) point[k] = dice.Below(5) == 0 ? 0.0 : dice.Wild(307);
        double const x = dice.Below(3) ? dice.Wild(307) : curve.p[static_cast<std::size_t>(dice.Below(4))][0];
        EXPECT_TRUE(std::isfinite(Slope(curve, x))) << curve << " at " << x;
        EXPECT_TRUE(std::isfinite(Bend(curve, x))) << curve << " at " << x;
        for (double const point : Points(curve, dice.Wild(20))) EXPECT_TRUE(std::isfinite(point)) << curve;
    }
}

TEST(CurveKernelSlope, ASegmentWithoutExtentHasSlopeZero)
{
    Curve curve;
    curve.p = {{{3, 10}, {4, 11}, {2, 12}, {3, 20}}};
    EXPECT_EQ(0, Slope(curve, 3));
    EXPECT_EQ(0, Bend(curve, 3));
    EXPECT_TRUE(Points(curve, 0).empty());
}

// ---- places with a given slope

TEST(CurveKernelSlopePoints, RowsThatCanBeCheckedByEye)
{
    using Xs = std::vector<double>;
    const struct {
        char const* why;
        Curve curve;
        double slope;
        Xs xs;
    } rows[] = {
        {"hill and valley, symmetric",
         Graph(3, 1.0 / 3, 1.0 / 3, 0, 2, -2, 0),
         0,
         {3 * (0.5 - std::sqrt(3.0) / 6), 3 * (0.5 + std::sqrt(3.0) / 6)}},
        {"eased at both keys: the keys themselves", Graph(2, 0.4, 0.4, 10, 10, 20, 20), 0, {0, 2}},
        {"eased at the end only", Graph(2, 0.4, 0.4, 10, 14, 20, 20), 0, {2}},
        {"a constant has no distinct point", Graph(2, 0.4, 0.7, 5, 5, 5, 5), 0, {}},
        {"a constant never climbs", Graph(2, 0.4, 0.7, 5, 5, 5, 5), 1, {}},
        {"a line has no distinct point", Graph(2, 0.25, 0.25, 10, 12.5, 17.5, 20), 5, {}},
        {"a line without handles has none either", Graph(2, 0, 0, 10, 10, 20, 20), 5, {}},
        {"nor another slope", Graph(2, 0, 0, 10, 10, 20, 20), 0, {}},
        {"x turns back, and y has its hill where nobody comes by", Graph(1, 2, 2, 0, 1, 1, 0), 0, {}},
        {"the slope touches 0 once", Graph(3, 1.0 / 3, 1.0 / 3, 0, 1, 0, 1), 0, {1.5}},
        {"a slope other than 0", Graph(3, 1.0 / 3, 1.0 / 3, 0, 2, 2, 3), 1, {1, 3}},
        {"no out handle: the start isn't flat", Graph(2, 0, 0.5, 10, 10, 16, 20), 0, {}},
        {"no out handle, but the limit is flat there", Graph(2, 0, 0.5, 10, 10, 10, 20), 0, {0}},
        {"no in handle, and the limit is flat there", Graph(2, 0.5, 0, 10, 20, 20, 20), 0, {2}},
    };
    for (auto const& row : rows) {
        Xs const found = Points(row.curve, row.slope);
        ASSERT_EQ(row.xs.size(), found.size()) << row.why;
        for (std::size_t i = 0; i < found.size(); ++i) EXPECT_NEAR(row.xs[i], found[i], 1e-7) << row.why;
    }
}

TEST(CurveKernelSlopePoints, EveryCrossingIsFoundAndHasTheSlope)
{
    Dice dice(33);
    for (int i = 0; i < 4000; ++i) {
        Curve const curve = Graph(1, dice.Between(0.02, 1), dice.Between(0.02, 1), dice.Between(-1, 1),
                                  dice.Between(-1, 1), dice.Between(-1, 1), dice.Between(-1, 1));
        double const slope = dice.Below(2) ? 0.0 : dice.Between(-4, 4);
        SCOPED_TRACE(testing::Message() << curve << " slope " << slope);
        std::vector<double> const found = Points(curve, slope);
        EXPECT_TRUE(found.size() < 2 || found[0] < found[1]);

        int crossings = 0;
        auto const excess = [&](int k) {
            Real const t = k / 2000.0L;
            return truth::FirstAt(curve, 1, t) - slope * truth::FirstAt(curve, 0, t);
        };
        for (int k = 0; k < 2000; ++k) crossings += (excess(k) < 0) != (excess(k + 1) < 0);
        EXPECT_EQ(crossings, static_cast<int>(found.size()));
        for (double const x : found)
            EXPECT_NEAR(slope, Slope(curve, x), 1e-6 * (1 + std::fabs(Bend(curve, x)))) << "at " << x;
    }
}

TEST(CurveKernelSlopePoints, RefusalsLeaveACountOfZero)
{
    Curve curve = Graph(1, 0.3, 0.3, 0, 1, 2, 3);
    CRV_Curve kernel = curve.Get();
    double xs[2] = {77, 77};
    int count = 5;
    EXPECT_EQ(CRV_Err_NullArgument, CRV_EvaluateXFromYPrime(nullptr, &count, xs, 0));
    EXPECT_EQ(0, count);
    EXPECT_EQ(CRV_Err_NullArgument, CRV_EvaluateXFromYPrime(&kernel, nullptr, xs, 0));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_EvaluateXFromYPrime(&kernel, &count, nullptr, 0));
    count = 5;
    EXPECT_EQ(CRV_Err_NotFinite, CRV_EvaluateXFromYPrime(&kernel, &count, xs, NaN));
    EXPECT_EQ(0, count);
    kernel.dimension = 3;
    EXPECT_EQ(CRV_Err_Dimension, CRV_EvaluateXFromYPrime(&kernel, &count, xs, 0));
    EXPECT_EQ(77, xs[0]);
}

}  // namespace
