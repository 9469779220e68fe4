// y from x, t from x, x from y.

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
constexpr double Infinite = std::numeric_limits<double>::infinity();
constexpr double Huge = std::numeric_limits<double>::max();

struct Named {
    char const* name;
    Curve curve;
};

// Odd shapes that keys can make. x runs over 2 seconds, y mostly from 10 to 20.
std::vector<Named> const Museum = {
    {"both influences one third", Graph(2, 1.0 / 3, 1.0 / 3, 10, 12, 21, 20)},
    {"sixths, as mixed linear sides have", Graph(2, 0.16666666667, 0.16666666667, 10, 10 + 10 * 0.16666666667, 18, 20)},
    {"eased on both sides", Graph(2, 0.5, 0.5, 10, 10, 20, 20)},
    {"influence 0 before", Graph(2, 0, 0.4, 10, 10, 22, 20)},
    {"influence 0 behind", Graph(2, 0.4, 0, 10, 7, 20, 20)},
    {"influence 0 on both sides", Graph(2, 0, 0, 10, 10, 20, 20)},
    {"influence 1 before", Graph(2, 1, 0.2, 10, 10, 20, 20)},
    {"influence 1 behind", Graph(2, 0.2, 1, 10, 10, 20, 20)},
    {"influence 1 on both sides: a plateau of x at the middle", Graph(2, 1, 1, 10, 10, 20, 20)},
    {"vertical at the start", Graph(2, 0, 0.3, 10, 25, 20, 20)},
    {"vertical at the end", Graph(2, 0.3, 0, 10, 10, -5, 20)},
    {"nearly a plateau", Graph(2, 0.999999, 1, 10, 10, 20, 20)},
    {"triple root: influence 0 and 1", Graph(2, 0, 1, 10, 11, 12, 20)},
    {"overshoot", Graph(2, 0.4, 0.4, 10, 40, -20, 20)},
    {"constant", Graph(2, 0.3, 0.8, 0.1, 0.1, 0.1, 0.1)},
    {"S on its side: x turns back once on the way", Graph(2, 1.6, 1.6, 10, 12, 18, 20)},
    {"out handle far beyond the end", Graph(2, 5, 0.3, 10, 12, 18, 20)},
    {"in handle far before the start", Graph(2, 0.3, 5, 10, 12, 18, 20)},
    {"out handle backwards", Graph(2, -1, 0.3, 10, 12, 18, 20)},
    {"both handles backwards", Graph(2, -0.5, -0.5, 10, 12, 18, 20)},
    {"both handles a thousand segments out", Graph(2, 1000, 1000, 10, 12, 18, 20)},
};

double EvaluateY(Curve curve, double x)
{
    CRV_Curve const kernel = curve.Get();
    double y = NaN;
    EXPECT_EQ(0, CRV_EvaluateYFromX(&kernel, &y, x));
    return y;
}

double EvaluateT(Curve curve, double x)
{
    CRV_Curve const kernel = curve.Get();
    double t = NaN;
    EXPECT_EQ(0, CRV_TFromX(&kernel, &t, x));
    return t;
}

// x at the answered t is the x asked for, no smaller t reaches it, and y is the curve's there. `steps` bounds the bumps
// that the truth can see.
void CheckSolve(Curve const& curve, double x, int steps)
{
    double const dt = curve.p[3][0];
    double const t = EvaluateT(curve, x);
    Real const residual = truth::At(curve, 0, t) - x;
    EXPECT_LE(std::fabs(static_cast<double>(residual)), 1e-13 * dt) << "t " << t;

    Real const first = truth::FirstReach(curve, 0, x, steps);
    Real const atFirst = truth::At(curve, 0, static_cast<Real>(t) - 1e-9L);
    EXPECT_TRUE(t <= first + 1e-9L || std::fabs(atFirst - x) < 1e-12L * dt) << "t " << t << ", first " << first;

    double const y = EvaluateY(curve, x);
    EXPECT_NEAR(static_cast<double>(truth::At(curve, 1, t)), y, 1e-14 * (std::fabs(y) + 50.0));
}

// The museum, random influences with 0 and 1 among them, and folded curves of all sizes.
TEST(CurveKernelSolve, ReachesTheAskedXAtTheSmallestParameter)
{
    for (Named const& piece : Museum)
        for (int i = 0; i <= 128; ++i) {
            SCOPED_TRACE(testing::Message() << piece.name << ", at " << i << "/128");
            CheckSolve(piece.curve, 2.0 * i / 128, 4000);
        }
    Dice dice(11);
    for (int i = 0; i < 20000; ++i) {
        double const choices[] = {0.0, 1.0, dice.Between(0, 1), dice.Between(0, 1), dice.Between(0, 1)};
        double const dt = dice.Between(0.01, 40);
        Curve const curve = Graph(dt, choices[dice.Below(5)], choices[dice.Below(5)], dice.Between(-10, 10),
                                  dice.Between(-10, 10), dice.Between(-10, 10), dice.Between(-10, 10));
        SCOPED_TRACE(testing::Message() << curve);
        CheckSolve(curve, dice.Between(0, dt), 1);
    }
    for (int i = 0; i < 1500; ++i) {
        Curve const curve =
            Graph(1, dice.Between(-3, 4), dice.Between(-3, 4), 0, dice.Between(-1, 2), dice.Between(-1, 2), 1);
        SCOPED_TRACE(testing::Message() << curve);
        CheckSolve(curve, dice.Between(0, 1), 4000);
    }
}

TEST(CurveKernelSolve, WellConditionedCurvesAreAccurateInY)
{
    Dice dice(12);
    for (int i = 0; i < 20000; ++i) {
        Curve const curve = Graph(1, dice.Between(0.1, 0.6), dice.Between(0.1, 0.6), dice.Between(-1, 1),
                                  dice.Between(-1, 1), dice.Between(-1, 1), dice.Between(-1, 1));
        double const x = dice.Between(0, 1);
        Real const expected = truth::At(curve, 1, truth::FirstReach(curve, 0, x, 1));
        EXPECT_NEAR(static_cast<double>(expected), EvaluateY(curve, x), 2e-13) << curve << " at " << x;
    }
}

TEST(CurveKernelSolve, InfluencesOfOneThirdMakeXTheParameter)
{
    Dice dice(14);
    for (int i = 0; i < 1000; ++i) {
        double const dt = dice.Between(0.001, 1000);
        double const x = dice.Between(0, dt);
        Curve const curve = Graph(dt, 1.0 / 3, 1.0 / 3, 0, 1, 2, 3);
        EXPECT_NEAR(x / dt, EvaluateT(curve, x), 4e-16) << dt << " " << x;
    }
}

TEST(CurveKernelSolve, OutsideTheSegmentTheEndsAnswer)
{
    for (Named const& piece : Museum) {
        SCOPED_TRACE(piece.name);
        for (double const before : {0.0, -1e-300, -1.0, -Huge, -Infinite})
            EXPECT_EQ(piece.curve.p[0][1], EvaluateY(piece.curve, before)) << before;
        for (double const after : {2.0, std::nextafter(2.0, 3.0), 1e9, Huge, Infinite})
            EXPECT_EQ(piece.curve.p[3][1], EvaluateY(piece.curve, after)) << after;
    }
}

TEST(CurveKernelSolve, AConstantComesBackToTheBit)
{
    Dice dice(15);
    for (int i = 0; i < 2000; ++i) {
        double const value = dice.Wild(300);
        Curve const curve = Graph(1, dice.Between(0, 1), dice.Between(0, 1), value, value, value, value);
        EXPECT_EQ(value, EvaluateY(curve, dice.Between(0, 1)));
    }
}

TEST(CurveKernelSolve, AnyFiniteCurveAnswersInsideItsHull)
{
    Dice dice(16);
    for (int i = 0; i < 20000; ++i) {
        Curve curve;
        for (auto& point : curve.p)
            for (std::size_t k = 0; k < 2; ++k) {
                double const odd[] = {0.0, -0.0, Huge, -Huge, std::numeric_limits<double>::denorm_min(), 1.0};
                point[k] = dice.Below(4) == 0 ? odd[dice.Below(6)] : dice.Wild(307);
            }
        double const share = dice.Between(0, 1);
        double const x = (1 - share) * curve.p[0][0] + share * curve.p[3][0];
        double const y = EvaluateY(curve, x);
        auto const [low, high] = std::minmax({curve.p[0][1], curve.p[1][1], curve.p[2][1], curve.p[3][1]});
        EXPECT_TRUE(y >= low && y <= high) << curve << " at " << x << " gives " << y;
        double const t = EvaluateT(curve, x);
        EXPECT_TRUE(t >= 0 && t <= 1) << curve << " at " << x << " gives " << t;
    }
}

TEST(CurveKernelSolve, ScaleAndPlaceOfTheSegmentDontMatter)
{
    Curve const plain = Graph(1, 0.3, 0.9, 0, 2, -1, 1);
    for (int const power : {-1040, -600, -30, 30, 600, 1020})
        for (double const share : {0.1, 0.5, 0.9}) {
            Curve scaled = plain;
            for (auto& point : scaled.p) point[0] = std::ldexp(point[0], power);
            double const tolerance = power < -1000 ? 1e-8 : 1e-13;  // denormal coordinates have few digits
            EXPECT_NEAR(EvaluateY(plain, share), EvaluateY(scaled, std::ldexp(share, power)), tolerance) << power;
        }
}

TEST(CurveKernelSolve, ASegmentWithoutExtentIsAStep)
{
    Curve curve;
    curve.p = {{{3, 10}, {4, 11}, {2, 12}, {3, 20}}};
    EXPECT_EQ(10, EvaluateY(curve, 2.5));
    EXPECT_EQ(10, EvaluateY(curve, 3));
    EXPECT_EQ(20, EvaluateY(curve, 3.5));
    curve.p = {};
    EXPECT_EQ(0, EvaluateY(curve, 0));
}

TEST(CurveKernelSolve, ASegmentThatRunsBackwardsIsItsMirrorImage)
{
    Dice dice(17);
    for (int i = 0; i < 2000; ++i) {
        Curve const forward =
            Graph(1, dice.Between(0, 1), dice.Between(0, 1), 0, dice.Between(-1, 2), dice.Between(-1, 2), 1);
        Curve mirrored = forward;
        for (auto& point : mirrored.p) point[0] = -point[0];
        double const x = dice.Between(0, 1);
        EXPECT_NEAR(EvaluateT(forward, x), EvaluateT(mirrored, -x), 1e-6) << forward << x;
        EXPECT_NEAR(x, -static_cast<double>(truth::At(mirrored, 0, EvaluateT(mirrored, -x))), 1e-13) << forward;
    }
}

// ---- x from y

TEST(CurveKernelInverse, FindsTheFirstXThatReachesY)
{
    Dice dice(21);
    for (int i = 0; i < 20000; ++i) {
        Curve curve = Graph(1, dice.Between(0, 1), dice.Between(0, 1), 0, dice.Between(-1, 2), dice.Between(-1, 2), 1);
        CRV_Curve kernel = curve.Get();
        ASSERT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, nullptr));
        double const y = dice.Between(0, 1);
        double x = NaN;
        ASSERT_EQ(0, CRV_EvaluateXFromY(&kernel, &x, y));
        Real const t = truth::FirstReach(curve, 1, y, 1);
        double const flatness = static_cast<double>(truth::FirstAt(curve, 1, t));
        EXPECT_NEAR(static_cast<double>(truth::At(curve, 0, t)), x, 1e-12 / std::max(flatness, 1e-8))
            << curve << " at " << y;
    }
}

TEST(CurveKernelInverse, WhereXTurnsBackTheJumpReachesY)
{
    // x climbs to its turn, falls back and climbs again; y grows all the way. Heights passed while x is behind its
    // turn are reached at the turn.
    Curve curve = Graph(1, 2, 2, 0, 0.2, 0.8, 1);
    CRV_Curve const kernel = curve.Get();
    double turn = 0;
    for (int i = 0; i < 5000; ++i) turn = std::max(turn, static_cast<double>(truth::At(curve, 0, i / 10000.0L)));
    double x = NaN;
    ASSERT_EQ(0, CRV_EvaluateXFromY(&kernel, &x, 0.5));
    EXPECT_NEAR(std::min(turn, 1.0), x, 1e-7);
}

TEST(CurveKernelInverse, TheEndsAnswerOutside)
{
    Curve curve = Graph(2, 0.4, 0.4, 10, 10, 20, 20);
    CRV_Curve const kernel = curve.Get();
    const struct {
        double y, x;
    } rows[] = {{10, 0}, {9, 0}, {-Infinite, 0}, {20, 2}, {21, 2}, {Infinite, 2}};
    for (auto const& row : rows) {
        double x = NaN;
        ASSERT_EQ(0, CRV_EvaluateXFromY(&kernel, &x, row.y));
        EXPECT_EQ(row.x, x) << row.y;
    }
    Curve flat = Graph(2, 0.4, 0.4, 10, 10, 10, 10);
    CRV_Curve const flatKernel = flat.Get();
    double x = NaN;
    ASSERT_EQ(0, CRV_EvaluateXFromY(&flatKernel, &x, 10));
    EXPECT_EQ(0, x);
}

// ---- refusals

using Solve = int (*)(CRV_Curve const*, double*, double);

TEST(CurveKernelRefusals, BadInputIsNamedAndLeavesTheAnswerAlone)
{
    const struct {
        char const* name;
        Solve solve;
        bool graph;
    } operations[] = {
        {"YFromX", CRV_EvaluateYFromX, true},      {"TFromX", CRV_TFromX, false},
        {"XFromY", CRV_EvaluateXFromY, true},      {"slope", CRV_Evaluate1dDerivFromX, true},
        {"bend", CRV_Evaluate1dDeriv2FromX, true}, {"point", CRV_EvaluatePoint, false},
        {"derivative", CRV_EvaluateDeriv, false},
    };
    for (auto const& operation : operations) {
        SCOPED_TRACE(operation.name);
        Curve curve = Graph(1, 0.3, 0.3, 0, 1, 2, 3);
        CRV_Curve kernel = curve.Get();
        double answers[4] = {77, 77, 77, 77};
        EXPECT_EQ(CRV_Err_NullArgument, operation.solve(nullptr, answers, 0.5));
        EXPECT_EQ(CRV_Err_NullArgument, operation.solve(&kernel, nullptr, 0.5));
        for (double* CRV_Curve::*point : {&CRV_Curve::p0, &CRV_Curve::p1, &CRV_Curve::p2, &CRV_Curve::p3}) {
            CRV_Curve broken = kernel;
            broken.*point = nullptr;
            EXPECT_EQ(CRV_Err_NullArgument, operation.solve(&broken, answers, 0.5));
        }
        for (short const dimension : {-1, 0}) {
            kernel.dimension = dimension;
            EXPECT_EQ(CRV_Err_Dimension, operation.solve(&kernel, answers, 0.5));
        }
        if (operation.graph)
            for (short const dimension : {1, 3, 4}) {
                kernel.dimension = dimension;
                EXPECT_EQ(CRV_Err_Dimension, operation.solve(&kernel, answers, 0.5));
            }
        kernel.dimension = 2;
        EXPECT_EQ(CRV_Err_NotFinite, operation.solve(&kernel, answers, NaN));
        for (std::size_t i = 0; i < 8; ++i)
            for (double const bad : {NaN, Infinite, -Infinite}) {
                if (i % 2 == 1 && operation.solve == CRV_TFromX) continue;  // doesn't look at y
                curve.p[i / 2][i % 2] = bad;
                EXPECT_EQ(CRV_Err_NotFinite, operation.solve(&kernel, answers, 0.5)) << "coordinate " << i;
                curve = Graph(1, 0.3, 0.3, 0, 1, 2, 3);
            }
        for (double const answer : answers) EXPECT_EQ(77, answer);
    }
}

// ---- bits

// The number is the one of every build so far, with gcc and clang, with and without optimisation. A change means that
// saved render identities no longer match: it needs a reason.
TEST(CurveKernelBits, AreTheSameInEveryBuild)
{
    truth::BitHash hash;
    Dice dice(99);
    for (int i = 0; i < 20000; ++i) {
        double const reach = i % 4 == 0 ? 2.0 : 1.0;
        double n[7];  // in an order of their own: that of arguments is the compiler's
        for (double& number : n) number = dice.Between(0, 1);
        Curve curve = Graph(0.1 + 9 * n[0], reach * n[1], reach * n[2], 9 * n[3], 9 * n[4], 9 * n[5], 9 * n[6]);
        CRV_Curve kernel = curve.Get();
        double const x = dice.Between(0, curve.p[3][0]);
        double answer = 0;
        for (Solve const solve : {&CRV_EvaluateYFromX, &CRV_Evaluate1dDerivFromX, &CRV_Evaluate1dDeriv2FromX}) {
            ASSERT_EQ(0, solve(&kernel, &answer, x));
            hash.Mix(answer);
        }
        ASSERT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, nullptr));
        for (auto const& point : curve.p) hash.Mix(point[0] + point[1]);
    }
    EXPECT_EQ(14348890206054346473u, hash.Get());
}

}  // namespace
