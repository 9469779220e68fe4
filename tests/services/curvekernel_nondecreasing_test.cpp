// The treatment that keeps a curve from running backwards.

#include "curvekernel_truth.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <limits>

namespace {

using truth::Curve;
using truth::Dice;
using truth::Graph;
using truth::Real;

// How far y falls back behind its height so far, as a share of the segment's height; sampled densely in t.
double FallsBack(Curve const& curve)
{
    Real const height = std::fabs(static_cast<double>(Real(curve.p[3][1]) - curve.p[0][1]));
    Real const direction = curve.p[3][1] < curve.p[0][1] ? -1 : 1;
    Real top = direction * curve.p[0][1];
    Real worst = 0;
    for (int i = 1; i <= 500; ++i) {
        Real const y = direction * truth::At(curve, 1, i / 500.0L);
        worst = std::max(worst, top - y);
        top = std::max(top, y);
    }
    return static_cast<double>(worst / height);
}

// Whether the slope of y by t is below 0 somewhere, or as good as.
bool NearlyFalls(Curve const& curve)
{
    Real const height = Real(curve.p[3][1]) - curve.p[0][1];
    for (int i = 0; i <= 2000; ++i)
        if (truth::FirstAt(curve, 1, i / 2000.0L) / height < 1e-5L) return true;
    return false;
}

Curve Treated(Curve curve, bool* moved = nullptr)
{
    CRV_Curve kernel = curve.Get();
    unsigned char changed = 0;
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, &changed));
    if (moved) *moved = changed != 0;
    return curve;
}

bool IsBetween(double value, double a, double b)
{
    return value >= std::min(a, b) && value <= std::max(a, b);
}

TEST(CurveKernelNonDecreasing, RowsThatCanBeCheckedByEye)
{
    const struct {
        char const* why;
        Curve before, after;
    } rows[] = {
        {"inside the box: untouched", Graph(2, 0.5, 0.25, 0, 8, 1, 10), Graph(2, 0.5, 0.25, 0, 8, 1, 10)},
        {"above the box, but y still grows: untouched", Graph(2, 0.5, 0.5, 0, 12, 7, 10),
         Graph(2, 0.5, 0.5, 0, 12, 7, 10)},
        {"out handle down: flat", Graph(2, 0.5, 0.25, 0, -3, 8, 10), Graph(2, 0.5, 0.25, 0, 0, 8, 10)},
        {"in handle above: flat", Graph(2, 0.5, 0.25, 0, 3, 11, 10), Graph(2, 0.5, 0.25, 0, 3, 10, 10)},
        {"out handle twice too long, nothing on the other side", Graph(2, 0.5, 0.25, 0, 20, 10, 10),
         Graph(2, 0.25, 0.25, 0, 10, 10, 10)},
        {"in handle twice too long", Graph(2, 0.5, 0.5, 0, 0, -10, 10), Graph(2, 0.5, 0.25, 0, 0, 0, 10)},
        {"both too long", Graph(2, 0.5, 0.5, 0, 20, -30, 10), Graph(2, 0.25, 0.125, 0, 10, 0, 10)},
        {"up, but too long beside a flat handle", Graph(2, 0.5, 0.25, 0, 40, 12, 10),
         Graph(2, 0.125, 0.25, 0, 10, 10, 10)},
        {"between equal values: flat", Graph(2, 0.5, 0.25, 4, 7, 1, 4), Graph(2, 0.5, 0.25, 4, 4, 4, 4)},
        {"falling steadily: untouched", Graph(2, 0.5, 0.25, 10, 8, 1, 0), Graph(2, 0.5, 0.25, 10, 8, 1, 0)},
    };
    for (auto const& row : rows) {
        bool moved = false;
        Curve const after = Treated(row.before, &moved);
        EXPECT_EQ(row.after, after) << row.why << ": " << after;
        EXPECT_EQ(row.before != row.after, moved) << row.why;
    }
}

TEST(CurveKernelNonDecreasing, RandomCurvesComeOutGrowingAndOtherwiseAsTheyWere)
{
    Dice dice(41);
    int touched = 0;
    for (int i = 0; i < 20000; ++i) {
        double const height = dice.Below(10) ? dice.Between(0.1, 5) : dice.Between(-5, -0.1);
        double const low = dice.Between(-5, 5);
        Curve const before =
            Graph(dice.Between(0.1, 5), dice.Between(0, 1.2), dice.Between(0, 1.2), low,
                  low + height * dice.Between(-1, 3), low + height * dice.Between(-2, 2), low + height);
        bool moved = false;
        Curve const after = Treated(before, &moved);
        SCOPED_TRACE(testing::Message() << before << "-> " << after);

        EXPECT_LE(FallsBack(after), 1e-15);
        EXPECT_EQ(before != after, moved);
        EXPECT_TRUE(moved || FallsBack(before) <= 1e-9);
        EXPECT_TRUE(!moved || NearlyFalls(before)) << "there was nothing to do";
        touched += moved;

        EXPECT_EQ(before.p[0], after.p[0]);
        EXPECT_EQ(before.p[3], after.p[3]);
        EXPECT_TRUE(IsBetween(after.p[1][0], before.p[0][0], before.p[1][0]));
        EXPECT_TRUE(IsBetween(after.p[2][0], before.p[3][0], before.p[2][0]));

        bool again = false;
        EXPECT_EQ(after, Treated(after, &again));
        EXPECT_FALSE(again);
    }
    EXPECT_GT(touched, 5000);
    EXPECT_LT(touched, 19000);
}

TEST(CurveKernelNonDecreasing, AShortenedHandleKeepsItsSlopeAndNoMoreThanNeededIsTaken)
{
    Dice dice(42);
    for (int i = 0; i < 5000; ++i) {
        double const inHeight = dice.Between(0, 1);  // the in handle, harmless
        double const outHeight = dice.Between(1, 5);
        Curve const before = Graph(1, 0.8, 0.3, 0, outHeight, 1 - inHeight, 1);
        Curve const after = Treated(before);
        EXPECT_NEAR(outHeight / 0.8, after.p[1][1] / after.p[1][0], 1e-12) << before;
        EXPECT_EQ(before.p[2], after.p[2]) << before;
        if (before != after) {
            Curve longer = after;
            longer.p[1][1] *= 1.01;
            EXPECT_GT(FallsBack(longer), inHeight < 1e-3 ? -1.0 : 0.0) << before << "-> " << after;
        }
    }
}

TEST(CurveKernelNonDecreasing, ASmallMoveOfAHandleMovesTheResultALittle)
{
    Dice dice(43);
    for (int i = 0; i < 20000; ++i) {
        double const out = dice.Between(-0.5, 3);
        double const in = dice.Between(-0.5, 3);
        Curve const a = Treated(Graph(1, 0.5, 0.5, 0, out, 1 - in, 1));
        Curve const b = Treated(Graph(1, 0.5, 0.5, 0, out + 1e-7, 1 - in + 1e-7, 1));
        for (std::size_t point : {1, 2}) EXPECT_NEAR(a.p[point][1], b.p[point][1], 1e-3) << out << " " << in;
    }
}

TEST(CurveKernelNonDecreasing, AnyFiniteCurveStaysFinite)
{
    Dice dice(44);
    for (int i = 0; i < 20000; ++i) {
        Curve curve;
        for (auto& point : curve.p)
            for (std::size_t k = 0; k < 2; ++k) point[k] = dice.Below(6) == 0 ? 0.0 : dice.Wild(308);
        Curve const after = Treated(curve);
        for (std::size_t point : {1, 2}) {
            EXPECT_TRUE(std::isfinite(after.p[point][0]) && std::isfinite(after.p[point][1])) << curve;
            EXPECT_TRUE(IsBetween(after.p[point][1], curve.p[0][1], curve.p[3][1]) || after == curve ||
                        std::fabs(after.p[point][1] / curve.p[3][1]) < 1.4 ||
                        std::fabs(after.p[point][1] / curve.p[0][1]) < 1.4)
                << curve << "-> " << after;
        }
        EXPECT_EQ(after, Treated(after)) << curve;
    }
}

TEST(CurveKernelNonDecreasing, RefusalsMoveNothingAndTheFlagIsOnlyEverSet)
{
    Curve const good = Graph(1, 0.5, 0.5, 0, 5, 1, 1);
    Curve curve = good;
    CRV_Curve kernel = curve.Get();
    unsigned char changed = 0;
    EXPECT_EQ(CRV_Err_NullArgument, CRV_CurveSetNonDecreasing(nullptr, &changed));
    kernel.dimension = 3;
    EXPECT_EQ(CRV_Err_Dimension, CRV_CurveSetNonDecreasing(&kernel, &changed));
    kernel.dimension = 2;
    for (std::size_t i = 0; i < 4; ++i) {
        curve = good;
        curve.p[i][1] = std::numeric_limits<double>::quiet_NaN();
        EXPECT_EQ(CRV_Err_NotFinite, CRV_CurveSetNonDecreasing(&kernel, &changed)) << i;
        curve.p[i][1] = good.p[i][1];
        EXPECT_EQ(good, curve) << i;
    }
    EXPECT_EQ(0, changed);
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, nullptr));
    EXPECT_EQ(1, curve.p[1][1]) << "treated, though nobody wants to know";
    changed = 9;
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, &changed));
    EXPECT_EQ(9, changed) << "nothing left to do";
}

}  // namespace
