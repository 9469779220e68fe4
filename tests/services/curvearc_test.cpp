// Arc lengths and the tables from distance to parameter.
#include "tests/services/museum/truth.h"
#include "tests/support/codes.h"
#include "tests/support/dice.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <limits>
#include <string_view>

namespace {

using truth::Real;
using truth::Ruler;

constexpr double NaN = std::numeric_limits<double>::quiet_NaN();
constexpr double Infinite = std::numeric_limits<double>::infinity();

// A table that gives itself back.
class Table {
public:
    Table(Curve& curve, double accuracy) : kernel_(curve.Get())
    {
        EXPECT_EQ(0, CRV_BuildArcSpline(&kernel_, &list, &length, accuracy));
    }
    ~Table()
    {
        if (list) EXPECT_EQ(0, SEQ_Dispose(list, 0));
    }
    Table(Table const&) = delete;
    Table& operator=(Table const&) = delete;

    double T(double s, double one = 1.0)
    {
        double t = NaN;
        EXPECT_EQ(0, CRV_TFromSSpline(&kernel_, &list, &t, s, one));
        return t;
    }
    int Knots() const { return (*list)->count - 2; }

    SEQ_Head** list = nullptr;
    double length = NaN;

private:
    CRV_Curve kernel_;
};

Curve const& Exhibited(std::string_view name)
{
    return std::find_if(
               Museum.begin(), Museum.end(), [name](Exhibit const& piece) { return name == piece.name; })
        ->curve;
}

// Length and places within the accuracy, and of many steps each as long as the others.
void CheckTable(Curve curve, Ruler const& ruler, double accuracy, int samples)
{
    Table table(curve, accuracy);
    EXPECT_NEAR(static_cast<double>(ruler.Length(0, 1)), table.length, accuracy);
    EXPECT_EQ(0, table.T(0));
    EXPECT_EQ(table.length > 0 ? 1 : 0, table.T(table.length));
    Real reached = 0, shortest = Infinite, longest = 0;
    double before = 0;
    for (int i = 1; i <= samples; ++i) {
        double const s = table.length * i / samples, t = table.T(s);
        EXPECT_TRUE(t >= before && t <= 1) << t << " after " << before;
        Real const step = ruler.Length(before, t);
        reached += step;
        shortest = std::min(shortest, step);
        longest = std::max(longest, step);
        EXPECT_NEAR(s, static_cast<double>(reached), accuracy) << "sample " << i << ", t " << t;
        before = t;
    }
    if (samples >= 500) EXPECT_LE((longest - shortest) * samples, 1e-3L * ruler.Length(0, 1));
}

TEST(CurveArc, MuseumIsMeasuredWithinTheAccuracyInEvenSteps)
{
    for (Exhibit const& piece : Museum) {
        Ruler const ruler(piece.curve);
        double const polygon = static_cast<double>(ruler.Polygon());
        ASSERT_NEAR(static_cast<double>(ruler.ExactLength()), static_cast<double>(ruler.Length(0, 1)), 1e-12 * polygon)
            << piece.name;
        Curve curve = piece.curve;
        EXPECT_LE(Table(curve, 1e-4 * polygon).Knots(), piece.mostKnots) << piece.name;
        for (auto const& [accuracy, samples] : {std::pair(1.0, 20),
                                                {1e-3 * std::max(polygon, 1e-3), 500},
                                                {1e-4, 50},
                                                {1e-8 * std::max(polygon, 1.0), 50}}) {
            SCOPED_TRACE(testing::Message() << piece.name << ", accuracy " << accuracy);
            CheckTable(piece.curve, ruler, accuracy, samples);
        }
        CRV_Curve const kernel = curve.Get();
        Table table(curve, 1e-6);
        for (int i = 0; i <= 10; ++i) {  // without a table the curve itself is measured
            SEQ_Head** none = nullptr;
            double t = NaN;
            double const s = table.length * i / 10;
            ASSERT_EQ(0, CRV_TFromSSpline(&kernel, &none, &t, s, 1.0));
            EXPECT_EQ(nullptr, none);
            EXPECT_NEAR(table.T(s), t, 1e-4) << piece.name;
            EXPECT_DOUBLE_EQ(4.0 * table.T(s), table.T(s, 4.0)) << "the end is what the caller says";
        }
    }
}

TEST(CurveArc, RandomSegmentsOfAllKinds)
{
    Dice dice(61);
    for (int i = 0; i < Rounds(1200); ++i) {
        Curve curve;
        curve.dimension = static_cast<short>(2 + i % 2);
        double const reach = dice.Below(4) ? 100.0 : 100000.0;
        for (std::size_t k = 0; k < curve.Size(); ++k) {
            curve.p[0][k] = dice.Between(-100, 100);
            curve.p[3][k] = curve.p[0][k] + dice.Between(-100, 100);
            curve.p[1][k] = curve.p[0][k] + dice.Between(-reach, reach);
            curve.p[2][k] = curve.p[3][k] + dice.Between(-reach, reach);
        }
        int const odd = dice.Below(8);  // of which one, two or none coincide
        if (odd == 0 || odd == 2) curve.p[1] = curve.p[0];
        if (odd == 1 || odd == 2) curve.p[2] = curve.p[3];
        if (odd == 3) curve.p[3] = curve.p[0];
        if (odd == 4) curve.p[2] = curve.p[1];
        if (odd == 5) curve.p[2] = curve.p[0];
        SCOPED_TRACE(testing::Message() << curve);
        Ruler const ruler(curve);
        CheckTable(curve, ruler, std::max(1e-4, 1e-7 * static_cast<double>(ruler.Polygon())), 12);
    }
}

TEST(CurveArc, AnyFiniteCurveHasATableWithoutNaN)
{
    Dice dice(62);
    double const accuracies[] = {1e-4, 0.0, -1.0, NaN, 1e300, Infinite};
    auto const check = [](Curve curve, double accuracy) {
        SCOPED_TRACE(testing::Message() << curve << ", accuracy " << accuracy);
        Table table(curve, accuracy);
        EXPECT_TRUE(std::isfinite(table.length) && table.length >= 0);
        for (double const share : {-1.0, 0.0, 1e-9, 0.3, 0.7, 1.0, 2.0}) {
            double const t = table.T(share * table.length);
            EXPECT_TRUE(t >= 0 && t <= 1) << t;
        }
        EXPECT_EQ(table.length > 0 ? 1 : 0, table.T(Infinite));
    };
    for (int i = 0; i < Rounds(1000); ++i) {
        Curve curve;
        curve.dimension = static_cast<short>(1 + i % 4);
        for (auto& point : curve.p)
            std::generate_n(point.begin(), curve.Size(), [&] { return dice.Below(5) == 0 ? 0.0 : dice.Wild(306); });
        check(curve, accuracies[dice.Below(6)]);
    }
    for (Exhibit const& piece : Museum)
        for (int const power : {-1030, -1045, -1070}) {
            Curve curve = piece.curve;
            for (auto& point : curve.p)
                for (double& c : point) c = std::ldexp(c, power);
            check(curve, 1e-4);
        }
}

TEST(CurveArc, ScaleDoesntMatter)
{
    Curve plain = Exhibited("a loop");
    Table unit(plain, 1e-3);
    for (int const power : {-1000, -500, -20, 20, 500, 1000}) {
        Curve curve = plain;
        for (auto& point : curve.p)
            for (double& c : point) c = std::ldexp(c, power);
        Table table(curve, std::ldexp(1e-3, power));
        EXPECT_EQ(unit.Knots(), table.Knots()) << power;
        EXPECT_EQ(unit.length, std::ldexp(table.length, -power)) << power;
        EXPECT_EQ(unit.T(0.3 * unit.length), table.T(0.3 * table.length)) << power;
    }
}

// A table in the place of an older one is the table that would have been made from nothing, to the last bit.
TEST(CurveArc, AnyTableCanTakeThePlaceOfAnyOther)
{
    Dice dice(63);
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    Curve first = Exhibited("a line at even speed");
    for (int i = 0; i < Rounds(20); ++i) {
        Table table(first, 1e-4);
        for (int round = 0; round < 25; ++round) {
            Curve curve = Museum[static_cast<std::size_t>(dice.Below(static_cast<int>(Museum.size())))].curve;
            double const accuracies[] = {1e-1, 1e-4, 1e-6}, accuracy = accuracies[dice.Below(3)];
            CRV_Curve const kernel = curve.Get();
            ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &table.list, &table.length, accuracy));
            Table fresh(curve, accuracy);
            ASSERT_EQ(fresh.Knots(), table.Knots());
            EXPECT_LE((*table.list)->capacity, 2 * (*table.list)->count);
            EXPECT_EQ(fresh.length, table.length);
            for (double const share : {0.0, 0.1, 0.37, 0.5, 0.93, 1.0})
                ASSERT_EQ(fresh.T(share * fresh.length), table.T(share * fresh.length));
            Q_FailAllocation(1);  // the same again needs no memory
            EXPECT_EQ(0, CRV_BuildArcSpline(&kernel, &table.list, &table.length, accuracy));
            EXPECT_FALSE(Q_FailAllocationFired());
            Q_FailAllocation(0);
        }
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// Returns whether memory was refused; the result is then 4, and nothing is left.
bool NeedsMemory(Curve& curve, SEQ_Head**& list, int n)
{
    CRV_Curve const kernel = curve.Get();
    double length = 77;
    Q_FailAllocation(n);
    int const code = CRV_BuildArcSpline(&kernel, &list, &length, 1e-4);
    bool const fired = Q_FailAllocationFired();
    Q_FailAllocation(0);
    EXPECT_EQ(fired ? 4 : 0, code);
    EXPECT_EQ(fired, list == nullptr);
    EXPECT_EQ(fired, length == 0);
    return fired;
}

TEST(CurveArc, ADragSeldomNeedsMemoryAndAFailureLeavesNothing)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    Curve curve = Exhibited("a loop"), small = Exhibited("a line at even speed");
    SEQ_Head** list = nullptr;
    EXPECT_FALSE(NeedsMemory(curve, list, 0));
    int needs = 0;
    for (int i = 0; i < 200; ++i) {
        curve.p[1][1] += 0.25;
        if (!NeedsMemory(curve, list, 1)) continue;
        ++needs;
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
        EXPECT_FALSE(NeedsMemory(curve, list, 0));
    }
    EXPECT_LT(needs, 10);
    EXPECT_EQ(0, SEQ_Dispose(list, 0));
    for (bool const replacing : {false, true}) {
        int failures = 0;
        for (bool fired = true; fired; failures += fired) {
            list = nullptr;
            if (replacing) EXPECT_FALSE(NeedsMemory(small, list, 0));
            fired = NeedsMemory(curve, list, failures + 1);
            if (list) EXPECT_EQ(0, SEQ_Dispose(list, 0));
            EXPECT_EQ(before, Q_MemoryLive(nullptr));
        }
        EXPECT_GE(failures, 1);
    }
}

TEST(CurveArc, AListOfSomethingElseIsReplacedAndNotRead)
{
    Curve curve = Exhibited("a gentle arc");
    CRV_Curve const kernel = curve.Get();
    Table const fresh(curve, 1e-4);
    for (auto const& [itemSize, count] : {std::pair(8, 0), {8, 1}, {8, 3}, {8, 500}, {32, 0}, {32, 1}, {32, 3}}) {
        SEQ_Head** list = nullptr;
        ASSERT_EQ(0, SEQ_New(0, static_cast<short>(itemSize), 4, 1, &list));
        ASSERT_EQ(0, SEQ_SetNumItems(count, list, 0));
        double t = 77, length = 77;
        EXPECT_EQ(SEQ_Err_BadList, CRV_TFromSSpline(&kernel, &list, &t, 1.0, 1.0));
        EXPECT_EQ(77, t);
        ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
        EXPECT_EQ(fresh.length, length);
        EXPECT_EQ(0, CRV_TFromSSpline(&kernel, &list, &t, length, 1.0));
        EXPECT_EQ(1, t);
        EXPECT_EQ(0, SEQ_Dispose(list, 0));
    }
}

TEST(CurveArc, BitsAreTheSameInEveryBuild)
{
    BitHash bits;
    for (std::size_t piece = 0; piece < 18; ++piece) {
        Curve curve = Museum[piece].curve;
        Table table(curve, 1e-4);
        bits.Mix(table.length);
        for (int i = 1; i < 100; ++i) bits.Mix(table.T(0.01 * i * table.length));
    }
    EXPECT_EQ(7814949628796522789u, bits.hash);
}

TEST(CurveArc, RefusalsLeaveNoTable)
{
    Curve curve = Exhibited("a gentle arc");
    CRV_Curve kernel = curve.Get();
    SEQ_Head** list = nullptr;
    double length = 77, t = 77;
    EXPECT_EQ(std::vector<int>(6, CRV_Err_NullArgument),
              Codes(CRV_BuildArcSpline(&kernel, nullptr, &length, 1e-4),
                    CRV_BuildArcSpline(&kernel, &list, nullptr, 1e-4),
                    CRV_BuildArcSpline(nullptr, &list, &length, 1e-4), CRV_TFromSSpline(&kernel, nullptr, &t, 0, 1.0),
                    CRV_TFromSSpline(&kernel, &list, nullptr, 0, 1.0), CRV_TFromSSpline(nullptr, &list, &t, 0, 1.0)));
    EXPECT_EQ(CRV_Err_NotFinite, CRV_TFromSSpline(&kernel, &list, &t, NaN, 1.0));
    for (double const bad : {NaN, Infinite}) {
        ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
        curve.p[2][1] = bad;
        EXPECT_EQ(CRV_Err_NotFinite, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
        EXPECT_EQ(nullptr, list);
        EXPECT_EQ(0, length);
        curve = Exhibited("a gentle arc");
    }
    for (short const dimension : {-1, 0, 5}) {
        kernel.dimension = dimension;
        EXPECT_EQ(CRV_Err_Dimension, CRV_BuildArcSpline(&kernel, &list, &length, 1e-4));
        EXPECT_EQ(CRV_Err_Dimension, CRV_TFromSSpline(&kernel, &list, &t, 0, 1.0));
    }
    EXPECT_EQ(77, t);
}

}  // namespace
