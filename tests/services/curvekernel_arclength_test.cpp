// Arc lengths and the tables from distance to parameter.

#include "curvekernel_truth.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <limits>
#include <string_view>
#include <vector>

namespace {

using truth::Curve;
using truth::Dice;
using truth::Real;

constexpr double NaN = std::numeric_limits<double>::quiet_NaN();

// The length of a path by Gauss's five points on ever smaller stretches. It starts from the places where the speed is
// smallest: a cusp next to the end of a stretch is what such a rule can miss.
class Ruler {
public:
    explicit Ruler(Curve const& curve) : curve_(curve)
    {
        for (std::size_t k = 0; k < 3; ++k)
            polygon_ += std::hypot(curve.p[k + 1][0] - curve.p[k][0], curve.p[k + 1][1] - curve.p[k][1],
                                   curve.p[k + 1][2] - curve.p[k][2]);
        for (int i = 0; i < 200; ++i) {
            Real low = i / 200.0L;
            Real high = (i + 1) / 200.0L;
            if (!(Slowing(low) < 0 && Slowing(high) >= 0)) continue;
            for (int half = 0; half < 70; ++half) (Slowing((low + high) / 2) < 0 ? low : high) = (low + high) / 2;
            cuts_.push_back(low);
        }
    }

    double Polygon() const { return polygon_; }
    Real Length(Real from, Real to) const
    {
        if (to < from) return -Length(to, from);
        Real sum = 0;
        for (Real const cut : cuts_)
            if (cut > from && cut < to) {
                sum += Refined(from, cut, Rule(from, cut), 0);
                from = cut;
            }
        return sum + Refined(from, to, Rule(from, to), 0);
    }

private:
    Real Slowing(Real t) const
    {
        Real sum = 0;
        for (std::size_t i = 0; i < 3; ++i) sum += truth::FirstAt(curve_, i, t) * truth::SecondAt(curve_, i, t);
        return sum;
    }
    Real Speed(Real t) const
    {
        Real squares = 0;
        for (std::size_t i = 0; i < 3; ++i) squares += truth::FirstAt(curve_, i, t) * truth::FirstAt(curve_, i, t);
        return std::sqrt(squares);
    }
    Real Rule(Real from, Real to) const
    {
        static constexpr Real Places[] = {0, 0.538469310105683091036L, 0.906179845938663992798L};
        static constexpr Real Weights[] = {0.568888888888888888889L, 0.478628670499366468041L,
                                           0.236926885056189087514L};
        Real const half = (to - from) / 2;
        Real const middle = (to + from) / 2;
        Real sum = Weights[0] * Speed(middle);
        for (int k = 1; k < 3; ++k)
            sum += Weights[k] * (Speed(middle - Places[k] * half) + Speed(middle + Places[k] * half));
        return half * sum;
    }
    Real Refined(Real from, Real to, Real whole, int depth) const
    {
        Real const middle = (from + to) / 2;
        Real const left = Rule(from, middle);
        Real const right = Rule(middle, to);
        if (depth > 40 || std::fabs(left + right - whole) <= 1e-13L * polygon_) return left + right;
        return Refined(from, middle, left, depth + 1) + Refined(middle, to, right, depth + 1);
    }

    Curve const& curve_;
    double polygon_ = 0.0;
    std::vector<Real> cuts_;
};

// A table that gives itself back.
class Table {
public:
    Table(Curve& curve, double accuracy) : kernel_(curve.Get())
    {
        code = CRV_BuildArcSpline(&kernel_, &list, &length, accuracy);
    }
    ~Table()
    {
        if (list) EXPECT_EQ(0, SEQ_Dispose(list, 0));
    }
    Table(Table const&) = delete;
    Table& operator=(Table const&) = delete;

    double T(double s)
    {
        double t = NaN;
        EXPECT_EQ(0, CRV_TFromSSpline(&kernel_, &list, &t, s, 1.0));
        return t;
    }
    int Knots() const { return (*list)->count - 2; }

    int code = 0;
    SEQ_Head** list = nullptr;
    double length = NaN;

private:
    CRV_Curve kernel_;
};

Curve Path(std::array<std::array<double, 3>, 4> const& points, short dimension)
{
    Curve curve;
    curve.dimension = dimension;
    for (std::size_t k = 0; k < 4; ++k) std::copy_n(points[k].begin(), 3, curve.p[k].begin());
    return curve;
}

struct Named {
    char const* name;
    Curve curve;
    int mostKnots;
};

std::vector<Named> const Museum = {
    {"a line at even speed", Path({{{0, 0}, {1, 2}, {2, 4}, {3, 6}}}, 2), 2},
    {"a line without handles", Path({{{0, 0}, {0, 0}, {3, 6}, {3, 6}}}, 2), 9},
    {"a line that turns back twice", Path({{{0, 0}, {30, 0}, {-20, 0}, {10, 0}}}, 2), 20},
    {"a gentle arc", Path({{{0, 0}, {30, 20}, {70, 20}, {100, 0}}}, 2), 4},
    {"a cusp in the middle", Path({{{0, 0}, {100, 100}, {0, 100}, {100, 0}}}, 2), 20},
    {"almost a cusp", Path({{{0, 0}, {100, 100}, {0.01, 100}, {100, 0}}}, 2), 20},
    {"a stop without a turn", Path({{{0, 0}, {80, 40}, {0, 0}, {80, 40}}}, 2), 100},
    {"a loop", Path({{{0, 0}, {150, 100}, {-50, 100}, {100, 0}}}, 2), 20},
    {"a loop back to its start", Path({{{0, 0}, {100, 50}, {-100, 50}, {0, 0}}}, 2), 21},
    {"no out handle", Path({{{0, 0}, {0, 0}, {50, 80}, {100, 0}}}, 2), 11},
    {"a short out handle", Path({{{0, 0}, {0.0025, 0.00125}, {70, 30}, {100, 0}}}, 2), 41},
    {"no in handle", Path({{{0, 0}, {50, 80}, {100, 0}, {100, 0}}}, 2), 11},
    {"three points in one", Path({{{0, 0}, {0, 0}, {0, 0}, {100, 40}}}, 2), 40},
    {"both handles at the end", Path({{{0, 0}, {100, 40}, {100, 40}, {100, 40}}}, 2), 40},
    {"one dimension", Path({{{0}, {5}, {7}, {10}}}, 1), 6},
    {"one dimension, overshooting", Path({{{0}, {50}, {-30}, {10}}}, 1), 20},
    {"a turn through space", Path({{{0, 0, 0}, {10, 0, 30}, {0, 40, 30}, {5, 5, -20}}}, 3), 14},
    {"handles a thousand chords long", Path({{{0, 0, 0}, {1000, 20, 3}, {-40, 900, 300}, {1, 0, 0}}}, 3), 15},
};

Named const& Exhibit(std::string_view name)
{
    return *std::find_if(
        Museum.begin(), Museum.end(), [name](Named const& piece) { return name == piece.name; });
}

// Length and places within the accuracy, and steps alike.
void CheckTable(Curve curve, double accuracy, int samples)
{
    Table table(curve, accuracy);
    ASSERT_EQ(0, table.code);
    Ruler const ruler(curve);
    EXPECT_NEAR(static_cast<double>(ruler.Length(0, 1)), table.length, accuracy);
    EXPECT_EQ(0, table.T(0));
    EXPECT_EQ(1, table.T(table.length));

    Real reached = 0;
    double before = 0;
    for (int i = 1; i <= samples; ++i) {
        double const s = table.length * i / samples;
        double const t = table.T(s);
        EXPECT_TRUE(t >= before && t <= 1) << t << " after " << before;
        reached += ruler.Length(before, t);
        EXPECT_NEAR(s, static_cast<double>(reached), accuracy) << "sample " << i << ", t " << t;
        before = t;
    }
}

TEST(CurveKernelArc, MuseumIsMeasuredWithinTheAccuracy)
{
    for (Named const& piece : Museum)
        for (double const accuracy : {1.0, 1e-2, 1e-4, 1e-6}) {
            SCOPED_TRACE(testing::Message() << piece.name << ", accuracy " << accuracy);
            CheckTable(piece.curve, accuracy, 100);
        }
}

TEST(CurveKernelArc, TablesAreNoLargerThanTheyNeed)
{
    for (Named const& piece : Museum) {
        Curve curve = piece.curve;
        Table table(curve, 1e-4 * Ruler(curve).Polygon());
        ASSERT_EQ(0, table.code) << piece.name;
        EXPECT_LE(table.Knots(), piece.mostKnots) << piece.name;
    }
}

TEST(CurveKernelArc, EqualDistancesAreEqualSteps)
{
    for (Named const& piece : Museum) {
        SCOPED_TRACE(piece.name);
        Curve curve = piece.curve;
        Ruler const ruler(curve);
        Table table(curve, 1e-3 * ruler.Polygon());
        Real shortest = std::numeric_limits<Real>::max();
        Real longest = 0;
        double before = 0;
        for (int i = 1; i <= 1000; ++i) {
            double const t = table.T(table.length * i / 1000);
            Real const step = ruler.Length(before, t);
            shortest = std::min(shortest, step);
            longest = std::max(longest, step);
            before = t;
        }
        EXPECT_LT(static_cast<double>((longest - shortest) / (ruler.Length(0, 1) / 1000)), 1e-3);
    }
}

TEST(CurveKernelArc, RandomSegmentsOfAllKinds)
{
    Dice dice(61);
    for (int i = 0; i < 3000; ++i) {
        Curve curve;
        curve.dimension = static_cast<short>(2 + i % 2);
        std::size_t const dimension = static_cast<std::size_t>(curve.dimension);
        double const reach = dice.Below(4) ? 1.0 : 1000.0;
        for (std::size_t k = 0; k < dimension; ++k) {
            curve.p[0][k] = dice.Between(-100, 100);
            curve.p[3][k] = curve.p[0][k] + dice.Between(-100, 100);
            curve.p[1][k] = curve.p[0][k] + reach * dice.Between(-100, 100);
            curve.p[2][k] = curve.p[3][k] + reach * dice.Between(-100, 100);
        }
        switch (dice.Below(8)) {
        case 0: curve.p[1] = curve.p[0]; break;
        case 1: curve.p[2] = curve.p[3]; break;
        case 2:
            curve.p[1] = curve.p[0];
            curve.p[2] = curve.p[3];
            break;
        case 3: curve.p[3] = curve.p[0]; break;
        case 4: curve.p[2] = curve.p[1]; break;
        case 5: curve.p[2] = curve.p[0]; break;
        default: break;
        }
        SCOPED_TRACE(testing::Message() << curve);
        CheckTable(curve, std::max(1e-4, 1e-7 * Ruler(curve).Polygon()), 12);
    }
}

TEST(CurveKernelArc, CoincidentPointsHaveNoLength)
{
    Curve curve = Path({{{7, -3, 2}, {7, -3, 2}, {7, -3, 2}, {7, -3, 2}}}, 3);
    Table table(curve, 1e-4);
    ASSERT_EQ(0, table.code);
    EXPECT_EQ(0, table.length);
    ASSERT_NE(nullptr, table.list);
    for (double const s : {-1.0, 0.0, 1.0}) EXPECT_EQ(0, table.T(s));
}

TEST(CurveKernelArc, AnyFiniteCurveHasATableWithoutNaN)
{
    Dice dice(62);
    for (int i = 0; i < 3000; ++i) {
        Curve curve;
        curve.dimension = static_cast<short>(1 + i % 4);
        for (auto& point : curve.p)
            for (std::size_t k = 0; k < static_cast<std::size_t>(curve.dimension); ++k)
                point[k] = dice.Below(5) == 0 ? 0.0 : dice.Wild(306);
        double const accuracies[] = {1e-4, 0.0, -1.0, NaN, 1e300, std::numeric_limits<double>::infinity()};
        Table table(curve, accuracies[dice.Below(6)]);
        ASSERT_EQ(0, table.code) << curve;
        EXPECT_TRUE(std::isfinite(table.length) && table.length >= 0) << curve;
        for (double const share : {-1.0, 0.0, 1e-9, 0.3, 0.7, 1.0, 2.0}) {
            double const t = table.T(share * table.length);
            EXPECT_TRUE(t >= 0 && t <= 1) << curve << t;
        }
        EXPECT_EQ(table.length > 0 ? 1 : 0, table.T(std::numeric_limits<double>::infinity()));
    }
}

TEST(CurveKernelArc, PathsNearTheSmallestNumbersHaveATableWithoutNaN)
{
    for (Named const& exhibit : Museum) {
        SCOPED_TRACE(exhibit.name);
        for (int const power : {-1030, -1045, -1070}) {
            Curve curve = exhibit.curve;
            for (auto& point : curve.p)
                for (double& c : point) c = std::ldexp(c, power);
            Table table(curve, 1e-4);
            ASSERT_EQ(0, table.code) << power;
            for (double const share : {0.0, 0.5, 1.0}) {
                double const t = table.T(share * table.length);
                EXPECT_TRUE(t >= 0 && t <= 1) << power << ' ' << t;
            }
        }
    }
}

TEST(CurveKernelArc, ScaleDoesntMatter)
{
    const Curve plain = Exhibit("a loop").curve;
    Curve same = plain;
    Table unit(same, 1e-3);
    for (int const power : {-1000, -500, -20, 20, 500, 1000}) {
        Curve curve = plain;
        for (auto& point : curve.p)
            for (double& c : point) c = std::ldexp(c, power);
        Table table(curve, std::ldexp(1e-3, power));
        ASSERT_EQ(0, table.code) << power;
        EXPECT_EQ(unit.Knots(), table.Knots()) << power;
        EXPECT_EQ(unit.length, std::ldexp(table.length, -power)) << power;
        EXPECT_EQ(unit.T(0.3 * unit.length), table.T(0.3 * table.length)) << power;
    }
}

TEST(CurveKernelArc, ASecondBuildReplacesTheTable)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    {
        Curve curve = Exhibit("a cusp in the middle").curve;
        Table table(curve, 1e-6);
        int const many = table.Knots();
        Curve line = Exhibit("a line at even speed").curve;
        CRV_Curve const kernel = line.Get();
        ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &table.list, &table.length, 1e-4));
        EXPECT_LT(table.Knots(), many);
        EXPECT_DOUBLE_EQ(std::sqrt(45.0), table.length);
        EXPECT_NEAR(0.25, table.T(0.25 * table.length), 1e-12);
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// A table in the place of an older one is the table that would have been made from nothing, to the last bit.
TEST(CurveKernelArc, AnyTableCanTakeThePlaceOfAnyOther)
{
    Dice dice(63);
    Curve first = Exhibit("a line at even speed").curve;
    Table table(first, 1e-4);
    for (int i = 0; i < 2000; ++i) {
        Curve curve = Museum[dice.Below(Museum.size())].curve;
        double const accuracies[] = {1e-1, 1e-4, 1e-6};
        double const accuracy = accuracies[dice.Below(3)];
        CRV_Curve const kernel = curve.Get();
        ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &table.list, &table.length, accuracy));
        Table fresh(curve, accuracy);
        ASSERT_EQ(fresh.Knots(), table.Knots());
        EXPECT_LE((*table.list)->capacity, 2 * (*table.list)->count);
        EXPECT_EQ(fresh.length, table.length);
        for (double const share : {0.0, 0.1, 0.37, 0.5, 0.93, 1.0})
            ASSERT_EQ(fresh.T(share * fresh.length), table.T(share * fresh.length));
    }
}

TEST(CurveKernelArc, ADragSeldomNeedsMemoryAndAnUnchangedCurveNever)
{
    Curve curve = Exhibit("a loop").curve;
    Table table(curve, 1e-4);
    auto const needsMemory = [&] {
        CRV_Curve const kernel = curve.Get();
        Q_FailAllocation(1);
        int const code = CRV_BuildArcSpline(&kernel, &table.list, &table.length, 1e-4);
        bool const fired = Q_FailAllocationFired();
        Q_FailAllocation(0);
        if (fired)
            EXPECT_EQ(0, CRV_BuildArcSpline(&kernel, &table.list, &table.length, 1e-4));
        else
            EXPECT_EQ(0, code);
        return fired;
    };
    int needs = 0;
    for (int i = 0; i < 200; ++i) {
        curve.p[1][1] += 0.25;
        needs += needsMemory();
        EXPECT_FALSE(needsMemory()) << i;
    }
    EXPECT_LT(needs, 10);
}

TEST(CurveKernelArc, EachFailingAllocationLeavesNothing)
{
    Curve small = Exhibit("a line at even speed").curve;
    Curve large = Exhibit("a loop").curve;
    CRV_Curve const smallKernel = small.Get();
    CRV_Curve const largeKernel = large.Get();
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (bool const replacing : {false, true}) {
        SCOPED_TRACE(replacing);
        int failures = 0;
        for (int n = 1; n < 20; ++n) {
            SEQ_Head** list = nullptr;
            double length = 77;
            if (replacing) ASSERT_EQ(0, CRV_BuildArcSpline(&smallKernel, &list, &length, 1e-4));
            Q_FailAllocation(n);
            int const code = CRV_BuildArcSpline(&largeKernel, &list, &length, 1e-4);
            bool const fired = Q_FailAllocationFired();
            Q_FailAllocation(0);
            if (!fired) {
                EXPECT_EQ(0, code);
                EXPECT_EQ(0, SEQ_Dispose(list, 0));
                break;
            }
            ++failures;
            EXPECT_EQ(4, code) << n;
            EXPECT_EQ(nullptr, list) << n;
            EXPECT_EQ(0, length) << n;
            EXPECT_EQ(before, Q_MemoryLive(nullptr)) << n;
        }
        EXPECT_GE(failures, 1);
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST(CurveKernelArc, AListOfSomethingElseIsReplacedAndNotRead)
{
    Curve curve = Exhibit("a gentle arc").curve;
    CRV_Curve const kernel = curve.Get();
    Table const fresh(curve, 1e-4);
    for (short const itemSize : {8, 32}) {
        for (int const count : {0, 1, 3, 500}) {
            if (itemSize == 32 && count > 3) continue;
            SEQ_Head** list = nullptr;
            ASSERT_EQ(0, SEQ_New(0, itemSize, 4, 1, &list));
            ASSERT_EQ(0, SEQ_SetNumItems(count, list, 0));
            double t = 77;
            EXPECT_EQ(SEQ_Err_BadList, CRV_TFromSSpline(&kernel, &list, &t, 1.0, 1.0));
            EXPECT_EQ(77, t);
            double length = 77;
            ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
            EXPECT_EQ(fresh.length, length);
            EXPECT_EQ(0, CRV_TFromSSpline(&kernel, &list, &t, length, 1.0));
            EXPECT_EQ(1, t);
            EXPECT_EQ(0, SEQ_Dispose(list, 0));
        }
    }
}

TEST(CurveKernelArc, WithoutATableTheCurveItselfIsMeasured)
{
    for (Named const& piece : Museum) {
        Curve curve = piece.curve;
        CRV_Curve const kernel = curve.Get();
        Table table(curve, 1e-6);
        for (int i = 0; i <= 10; ++i) {
            SEQ_Head** none = nullptr;
            double t = NaN;
            double const s = table.length * i / 10;
            ASSERT_EQ(0, CRV_TFromSSpline(&kernel, &none, &t, s, 1.0));
            EXPECT_EQ(nullptr, none);
            EXPECT_NEAR(table.T(s), t, 1e-4) << piece.name;
        }
    }
}

TEST(CurveKernelArc, TheFifthArgumentIsTheParameterAtTheEnd)
{
    Curve curve = Exhibit("a gentle arc").curve;
    CRV_Curve const kernel = curve.Get();
    Table table(curve, 1e-4);
    double t = NaN;
    ASSERT_EQ(0, CRV_TFromSSpline(&kernel, &table.list, &t, table.length, 4.0));
    EXPECT_EQ(4.0, t);
    ASSERT_EQ(0, CRV_TFromSSpline(&kernel, &table.list, &t, 0.5 * table.length, 4.0));
    EXPECT_DOUBLE_EQ(4.0 * table.T(0.5 * table.length), t);
}

// The same in every build so far, with gcc and clang, with and without optimisation; see CurveKernelBits.
TEST(CurveKernelArc, BitsAreTheSameInEveryBuild)
{
    truth::BitHash hash;
    for (Named const& piece : Museum) {
        Curve curve = piece.curve;
        Table table(curve, 1e-4);
        hash.Mix(table.length);
        for (int i = 1; i < 100; ++i) hash.Mix(table.T(0.01 * i * table.length));
    }
    EXPECT_EQ(7814949628796522789u, hash.Get());
}

TEST(CurveKernelArc, RefusalsLeaveNoTable)
{
    Curve curve = Exhibit("a gentle arc").curve;
    CRV_Curve kernel = curve.Get();
    SEQ_Head** list = nullptr;
    double length = 77;
    double t = 77;
    EXPECT_EQ(CRV_Err_NullArgument, CRV_BuildArcSpline(&kernel, nullptr, &length, 1e-4));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_BuildArcSpline(&kernel, &list, nullptr, 1e-4));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_TFromSSpline(&kernel, nullptr, &t, 0, 1.0));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_TFromSSpline(&kernel, &list, nullptr, 0, 1.0));
    EXPECT_EQ(CRV_Err_NotFinite, CRV_TFromSSpline(&kernel, &list, &t, NaN, 1.0));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_TFromSSpline(nullptr, &list, &t, 0, 1.0));

    ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
    curve.p[2][1] = NaN;
    EXPECT_EQ(CRV_Err_NotFinite, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
    EXPECT_EQ(nullptr, list);
    EXPECT_EQ(0, length);
    for (short const dimension : {-1, 0, 5}) {
        kernel.dimension = dimension;
        EXPECT_EQ(CRV_Err_Dimension, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
        EXPECT_EQ(CRV_Err_Dimension, CRV_TFromSSpline(&kernel, &list, &t, 0, 1.0));
    }
    EXPECT_EQ(77, t);
}

}  // namespace
