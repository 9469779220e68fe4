// Places on a curve by parameter, and its split.

#include "curvekernel_truth.h"

#include <gtest/gtest.h>

#include <limits>

namespace {

using truth::Curve;
using truth::Dice;

constexpr double NaN = std::numeric_limits<double>::quiet_NaN();

Curve RandomPath(Dice& dice, short dimension)
{
    Curve curve;
    curve.dimension = dimension;
    for (auto& point : curve.p)
        for (short i = 0; i < dimension; ++i) point[static_cast<std::size_t>(i)] = dice.Between(-100, 100);
    return curve;
}

TEST(CurveKernelPoint, IsDeCasteljausInEveryDimension)
{
    Dice dice(51);
    for (int round = 0; round < 5000; ++round) {
        Curve curve = RandomPath(dice, static_cast<short>(1 + round % 4));
        CRV_Curve const kernel = curve.Get();
        double const t = dice.Between(0, 1);
        double point[5] = {77, 77, 77, 77, 77};
        double vector[5] = {77, 77, 77, 77, 77};
        ASSERT_EQ(0, CRV_EvaluatePoint(&kernel, point, t));
        ASSERT_EQ(0, CRV_EvaluateDeriv(&kernel, vector, t));
        for (std::size_t i = 0; i < 5; ++i) {
            if (i >= static_cast<std::size_t>(curve.dimension)) {
                EXPECT_EQ(77, point[i]);  // no coordinate too many
                EXPECT_EQ(77, vector[i]);
                continue;
            }
            EXPECT_NEAR(static_cast<double>(truth::At(curve, i, t)), point[i], 1e-13) << curve;
            EXPECT_NEAR(static_cast<double>(truth::FirstAt(curve, i, t)), vector[i], 1e-12) << curve;
        }
    }
}

TEST(CurveKernelPoint, TheEndsAreExactAndHoldOutside)
{
    Dice dice(52);
    for (int round = 0; round < 1000; ++round) {
        Curve curve = RandomPath(dice, 3);
        CRV_Curve const kernel = curve.Get();
        const struct {
            double t;
            std::size_t end;
        } rows[] = {{0, 0}, {-0.5, 0}, {1, 3}, {1.0000001, 3}, {1e300, 3}};
        for (auto const& row : rows) {
            double point[3];
            double vector[3];
            ASSERT_EQ(0, CRV_EvaluatePoint(&kernel, point, row.t));
            ASSERT_EQ(0, CRV_EvaluateDeriv(&kernel, vector, row.t));
            for (std::size_t i = 0; i < 3; ++i) {
                EXPECT_EQ(curve.p[row.end][i], point[i]) << row.t;
                double const handle = row.end ? curve.p[3][i] - curve.p[2][i] : curve.p[1][i] - curve.p[0][i];
                EXPECT_DOUBLE_EQ(handle, vector[i] / 3.0) << row.t;
            }
        }
    }
}

TEST(CurveKernelPoint, AHeldCoordinateStaysToTheBit)
{
    Dice dice(53);
    for (int round = 0; round < 5000; ++round) {
        Curve curve = RandomPath(dice, 3);
        for (auto& point : curve.p) point[2] = 0.1;
        CRV_Curve const kernel = curve.Get();
        double point[3];
        double rows[15];
        double const t = dice.Between(0, 1);
        ASSERT_EQ(0, CRV_EvaluatePoint(&kernel, point, t));
        ASSERT_EQ(0, CRV_SubdivideCurve(&kernel, rows, t));
        EXPECT_EQ(0.1, point[2]);
        for (int row = 0; row < 5; ++row) EXPECT_EQ(0.1, rows[3 * row + 2]);
    }
}

TEST(CurveKernelSubdivide, BothHalvesRunAlongTheWhole)
{
    Dice dice(54);
    for (int round = 0; round < 3000; ++round) {
        Curve whole = RandomPath(dice, static_cast<short>(1 + round % 4));
        CRV_Curve const kernel = whole.Get();
        double const t = round % 10 == 0 ? round % 20 / 10.0 : dice.Between(0, 1);  // the ends too
        double rows[21];
        std::size_t const dimension = static_cast<std::size_t>(whole.dimension);
        rows[5 * dimension] = 77;
        ASSERT_EQ(0, CRV_SubdivideCurve(&kernel, rows, t));
        EXPECT_EQ(77, rows[5 * dimension]);

        Curve left = whole;
        Curve right = whole;
        for (std::size_t i = 0; i < dimension; ++i) {
            left.p[1][i] = rows[i];
            left.p[2][i] = rows[dimension + i];
            left.p[3][i] = right.p[0][i] = rows[2 * dimension + i];
            right.p[1][i] = rows[3 * dimension + i];
            right.p[2][i] = rows[4 * dimension + i];
        }
        if (t == 0 || t == 1) {
            EXPECT_EQ(whole, t == 0 ? right : left) << "to the bit";
            for (auto const& point : {t == 0 ? left.p[1] : right.p[0], t == 0 ? left.p[3] : right.p[2]})
                EXPECT_EQ(whole.p[t == 0 ? 0 : 3], point);
        }
        for (int k = 0; k <= 8; ++k)
            for (std::size_t i = 0; i < dimension; ++i) {
                truth::Real const at = k / 8.0L;
                EXPECT_NEAR(static_cast<double>(truth::At(whole, i, at * t)),
                            static_cast<double>(truth::At(left, i, at)), 1e-12);
                EXPECT_NEAR(static_cast<double>(truth::At(whole, i, t + at * (1 - truth::Real(t)))),
                            static_cast<double>(truth::At(right, i, at)), 1e-12);
            }
    }
}

TEST(CurveKernelSubdivide, RefusalsWriteNothing)
{
    Dice dice(56);
    Curve curve = RandomPath(dice, 2);
    CRV_Curve kernel = curve.Get();
    double rows[10] = {77};
    EXPECT_EQ(CRV_Err_NullArgument, CRV_SubdivideCurve(nullptr, rows, 0.5));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_SubdivideCurve(&kernel, nullptr, 0.5));
    EXPECT_EQ(CRV_Err_NotFinite, CRV_SubdivideCurve(&kernel, rows, NaN));
    kernel.dimension = 0;
    EXPECT_EQ(CRV_Err_Dimension, CRV_SubdivideCurve(&kernel, rows, 0.5));
    kernel.dimension = 5;
    EXPECT_EQ(CRV_Err_Dimension, CRV_SubdivideCurve(&kernel, rows, 0.5));
    double answer[5] = {77};
    EXPECT_EQ(CRV_Err_Dimension, CRV_EvaluatePoint(&kernel, answer, 0.5));
    EXPECT_EQ(CRV_Err_Dimension, CRV_EvaluateDeriv(&kernel, answer, 0.5));
    kernel.dimension = 2;
    curve.p[1][1] = NaN;
    EXPECT_EQ(CRV_Err_NotFinite, CRV_SubdivideCurve(&kernel, rows, 0.5));
    EXPECT_EQ(77, rows[0]);
    EXPECT_EQ(77, answer[0]);
}

}  // namespace
