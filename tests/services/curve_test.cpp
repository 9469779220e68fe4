// All operations on curves against the truth: on the museum, on random curves, and at the ends of the range of doubles.
#include "tests/services/museum/truth.h"
#include "tests/support/dice.h"

#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <functional>
#include <limits>
#include <string_view>

namespace {

using truth::Real;
using Operation = int (*)(CRV_Curve const*, double*, double);

constexpr double NaN = std::numeric_limits<double>::quiet_NaN();
constexpr double Infinite = std::numeric_limits<double>::infinity();
constexpr double Huge = std::numeric_limits<double>::max();

double Ask(Operation operation, Curve curve, double argument)
{
    CRV_Curve const kernel = curve.Get();
    double answer = NaN;
    EXPECT_EQ(0, operation(&kernel, &answer, argument));
    return answer;
}

std::vector<double> PlacesOfSlope(Curve curve, double slope)
{
    CRV_Curve const kernel = curve.Get();
    double xs[3] = {NaN, NaN, 77.0};
    int count = -1;
    EXPECT_EQ(0, CRV_EvaluateXFromYPrime(&kernel, &count, xs, slope));
    EXPECT_EQ(77.0, xs[2]);
    EXPECT_TRUE(count >= 0 && count <= 2) << count;
    return {xs, xs + std::clamp(count, 0, 2)};
}

Curve Treated(Curve curve, bool* moved = nullptr)
{
    CRV_Curve kernel = curve.Get();
    unsigned char changed = 0;
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, &changed));
    if (moved) *moved = changed != 0;
    return curve;
}

// The longest step between neighbouring control points in one coordinate, and the largest coordinate.
double Step(Curve const& curve, std::size_t i)
{
    double step = 0;
    for (std::size_t k = 0; k < 3; ++k) step = std::max(step, std::fabs(curve.p[k + 1][i] - curve.p[k][i]));
    return step;
}
double Size(Curve const& curve, std::size_t i)
{
    double size = 0;
    for (auto const& point : curve.p) size = std::max(size, std::fabs(point[i]));
    return size;
}

// Slope and bend at the parameter that the kernel has for x: quotients of the exact derivatives, their limits where the
// curve stands still at an end, and a millionth of a millionth of the segment where it is vertical.
void CheckSlopes(Curve const& curve, double x, Real t)
{
    double const slope = Ask(CRV_Evaluate1dDerivFromX, curve, x);
    double const bend = Ask(CRV_Evaluate1dDeriv2FromX, curve, x);
    EXPECT_TRUE(std::isfinite(slope) && std::isfinite(bend));
    Real const dt = Real(curve.p[3][0]) - curve.p[0][0];
    if (dt == 0) {
        EXPECT_EQ(0, slope);
        EXPECT_EQ(0, bend);
        return;
    }
    Real const least = 1e-12L * dt;
    Real dx = truth::FirstAt(curve, 0, t), ddx = truth::SecondAt(curve, 0, t);
    Real dy = truth::FirstAt(curve, 1, t), ddy = truth::SecondAt(curve, 1, t);
    Real const noiseX = 1e-15L * Step(curve, 0), noiseY = 1e-15L * Step(curve, 1);
    Real const share = std::fabs(dx / least);
    if (share > 0.4L && share < 2.5L) return;
    if (share <= 1 && std::fabs(dy) <= 1e3L * noiseY) {
        EXPECT_EQ(0, bend);
        if (t > 0 && t < 1) return;
        Real const limit = std::fabs(ddx) > std::fabs(least) ? ddy / ddx : (curve.p[3][1] - Real(curve.p[0][1])) / dt;
        if (std::fabs(ddx) <= std::fabs(least) && std::fabs(ddy) > noiseY) return;
        EXPECT_NEAR(static_cast<double>(limit), slope, 1e-12 * (1 + std::fabs(static_cast<double>(limit))));
        return;
    }
    if (share <= 1) dx = least;
    Real const wanted = dy / dx;
    Real const noise =
        8 * (noiseY + std::fabs(wanted) * (share > 1 ? noiseX : 0)) / std::fabs(dx) + 1e-15L * std::fabs(wanted);
    EXPECT_NEAR(static_cast<double>(wanted), slope, static_cast<double>(noise));
    Real const wantedBend = (ddy - wanted * ddx) / dx / dx;
    Real const noiseBend = (64 * (noiseY + std::fabs(wanted) * noiseX) + noise * std::fabs(ddx)) / dx / dx +
                           16 * std::fabs(wantedBend) * ((share > 1 ? noiseX / std::fabs(dx) : 0) + 1e-15L);
    EXPECT_NEAR(static_cast<double>(wantedBend), bend, static_cast<double>(noiseBend));
}

// The parameter at x is the smallest whose x reaches it, to 1e-13 of the segment, and y is the curve's there.
void CheckSolve(Curve const& curve, double x)
{
    SCOPED_TRACE(testing::Message() << "x " << x);
    double const t = Ask(CRV_TFromX, curve, x), y = Ask(CRV_EvaluateYFromX, curve, x);
    double const dt = curve.p[3][0] - curve.p[0][0];
    if (dt == 0) {
        EXPECT_EQ(curve.p[x > curve.p[0][0] ? 3 : 0][1], y);
        return;
    }
    Real const slack = 1.01e-13L * dt;
    if (dt > 0 ? x <= curve.p[0][0] : x >= curve.p[0][0]) {
        EXPECT_EQ(0, t);
    } else if (dt > 0 ? x >= curve.p[3][0] : x <= curve.p[3][0]) {
        EXPECT_EQ(1, t);
    } else {
        EXPECT_LE(std::fabs(truth::At(curve, 0, t) - x), std::fabs(slack)) << "t " << t;
        EXPECT_GE(t, truth::FirstReach(curve, 0, x - slack) - 1e-15L);
        EXPECT_LE(t, truth::FirstReach(curve, 0, x + slack) + 1e-15L);
    }
    EXPECT_NEAR(static_cast<double>(truth::At(curve, 1, t)), y, 1e-15 * Size(curve, 1));
    CheckSlopes(curve, x, t);
}

// A height of a curve that doesn't fall: the first x that reaches it, which is the turn where x turns back.
void CheckInverse(Curve const& curve, double y)
{
    Real const height = Real(curve.p[3][1]) - curve.p[0][1], slack = 1e-13L * height;
    double const x = Ask(CRV_EvaluateXFromY, curve, y);
    Real const low = truth::FurthestX(curve, truth::FirstReach(curve, 1, y - slack));
    Real const high = truth::FurthestX(curve, truth::FirstReach(curve, 1, y + slack));
    Real const rounding = 1e-13L * (curve.p[3][0] - curve.p[0][0]);
    EXPECT_TRUE(std::min(low, high) - std::fabs(rounding) <= x && x <= std::max(low, high) + std::fabs(rounding))
        << x << " isn't between " << low << " and " << high << ", y " << y;
}

// Where x never turns back: the x of all places with that slope, those of vertical tangents left out, and an end at which
// the curve stands still where that slope is its limit.
bool CheckPlacesOfSlope(Curve const& curve, double slope)
{
    SCOPED_TRACE(testing::Message() << "slope " << slope);
    truth::SlopePlaces const places = truth::PlacesOfSlope(curve, slope);
    if (places.apart > 0 && places.apart < 1e-6L) return false;  // two or none is a matter of the last digit
    Real excess = 0;
    for (Real const t : {0.0L, 0.5L, 1.0L})
        excess = std::max(excess, std::fabs(truth::FirstAt(curve, 1, t) - slope * truth::FirstAt(curve, 0, t)));
    if (excess > 0 && excess < 1e-6L * Step(curve, 1)) return false;  // as good as straight
    std::vector<Real> wanted;
    Real const dt = Real(curve.p[3][0]) - curve.p[0][0];
    for (Real const t : places.ts) {
        Real const dx = truth::FirstAt(curve, 0, t), ddx = truth::SecondAt(curve, 0, t);
        bool const standsStill = dx == 0 && truth::FirstAt(curve, 1, t) == 0;
        if (standsStill ? ddx != 0 && truth::SecondAt(curve, 1, t) == slope * ddx : dx / dt > 1e-12L)
            wanted.push_back(truth::At(curve, 0, t));
    }
    std::vector<double> const found = PlacesOfSlope(curve, slope);
    EXPECT_EQ(wanted.size(), found.size());
    std::sort(wanted.begin(), wanted.end());
    for (std::size_t k = 0; k < std::min(found.size(), wanted.size()); ++k)
        EXPECT_NEAR(static_cast<double>(wanted[k]), found[k],
                    places.apart > 0 ? static_cast<double>(1e-13L * std::fabs(dt) / places.apart) : 1e-7);
    return true;
}

bool IsBetween(double value, double a, double b)
{
    return value >= std::min(a, b) && value <= std::max(a, b);
}

// The treatment leaves what grows to the bit, makes the rest grow, keeps the ends and moves handles towards them only.
void CheckNonDecreasing(Curve const& before)
{
    bool moved = false, again = false;
    Curve const after = Treated(before, &moved);
    SCOPED_TRACE(testing::Message() << "-> " << after);
    double const height = std::fabs(before.p[3][1] - before.p[0][1]);
    EXPECT_LE(truth::FallsBack(after), 1e-15L * height);
    EXPECT_EQ(before != after, moved);
    EXPECT_TRUE(moved || truth::FallsBack(before) <= 1e-9L * height);
    if (moved) {
        // A handle a thousandth steeper on each side would fall, or just about: there was something to do.
        Curve steeper = before;
        for (std::size_t k : {1, 2}) steeper.p[k][1] += 1e-5 * (before.p[k][1] - before.p[k == 1 ? 0 : 3][1]);
        EXPECT_GT(truth::FallsBack(steeper), 0) << "there was nothing to do";
    }
    for (std::size_t end : {0, 3}) {
        std::size_t const handle = end ? 2 : 1;
        EXPECT_EQ(before.p[end], after.p[end]);
        EXPECT_TRUE(IsBetween(after.p[handle][0], before.p[end][0], before.p[handle][0]));
    }
    EXPECT_EQ(after, Treated(after, &again));
    EXPECT_FALSE(again);
}

// Point, derivative and split at t; nothing behind the coordinates is written.
void CheckPlace(Curve curve, double t)
{
    SCOPED_TRACE(testing::Message() << "t " << t);
    CRV_Curve const kernel = curve.Get();
    double point[5], vector[5], rows[21];
    for (double* answer : {point, vector}) std::fill_n(answer, 5, 77.0);
    std::fill_n(rows, 21, 77.0);
    ASSERT_EQ(0, CRV_EvaluatePoint(&kernel, point, t));
    ASSERT_EQ(0, CRV_EvaluateDeriv(&kernel, vector, t));
    ASSERT_EQ(0, CRV_SubdivideCurve(&kernel, rows, t));
    EXPECT_TRUE(point[curve.Size()] == 77 && vector[curve.Size()] == 77 && rows[5 * curve.Size()] == 77);
    double const limited = std::clamp(t, 0.0, 1.0);
    auto const split = truth::Split(curve, limited);
    for (std::size_t i = 0; i < curve.Size(); ++i) {
        double const noise = 1e-15 * Size(curve, i);
        double const wanted[] = {curve.p[0][i], curve.p[1][i], curve.p[2][i], curve.p[3][i]};
        auto const [low, high] = std::minmax_element(wanted, wanted + 4);
        EXPECT_NEAR(static_cast<double>(split[2][i]), point[i], noise);
        EXPECT_NEAR(static_cast<double>(truth::FirstAt(curve, i, limited)), vector[i], 12 * noise);
        EXPECT_TRUE(point[i] >= *low && point[i] <= *high) << "a held coordinate stays to the bit";
        for (std::size_t row = 0; row < 5; ++row) {
            double const answer = rows[row * curve.Size() + i];
            EXPECT_NEAR(static_cast<double>(split[row][i]), answer, noise) << "row " << row;
            EXPECT_TRUE(answer >= *low && answer <= *high) << "row " << row;
            double const atEnd = limited == 0 ? wanted[row < 3 ? 0 : row - 2] : wanted[row < 3 ? row + 1 : 3];
            EXPECT_TRUE((limited > 0 && limited < 1) || answer == atEnd) << "row " << row;
        }
        EXPECT_TRUE((limited > 0 && limited < 1) || point[i] == wanted[limited == 0 ? 0 : 3]);
    }
}

// ---- arc lengths

// A table that gives itself back.
class Table {
public:
    Table(Curve& curve, double accuracy) : kernel_(curve.Get())
    {
        EXPECT_EQ(0, CRV_BuildArcSpline(&kernel_, &list, &length, accuracy));
    }
    ~Table() { EXPECT_EQ(0, list ? SEQ_Dispose(list, 0) : 0); }
    Table(Table const&) = delete;
    Table& operator=(Table const&) = delete;

    double T(double s, double one = 1.0)
    {
        double t = NaN;
        EXPECT_EQ(0, CRV_TFromSSpline(&kernel_, &list, &t, s, one));
        return t;
    }
    int Knots() const { return (*list)->count - 2; }
    SEQ_Head** Release() { return std::exchange(list, nullptr); }

    SEQ_Head** list = nullptr;
    double length = NaN;

private:
    CRV_Curve kernel_;
};

// Length and places within the accuracy, and of many steps each as long as the others.
void CheckTable(Curve curve, truth::Ruler const& ruler, double accuracy, int samples)
{
    SCOPED_TRACE(testing::Message() << "accuracy " << accuracy);
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
    EXPECT_TRUE(samples < 500 || (longest - shortest) * samples <= 1e-3L * ruler.Length(0, 1));
}

Curve const& Exhibited(std::string_view name)
{
    return std::find_if(
               Museum.begin(), Museum.end(), [name](Exhibit const& piece) { return name == piece.name; })
        ->curve;
}

Curve Scaled(Curve curve, int power, std::size_t coordinates)
{
    for (auto& point : curve.p)
        for (std::size_t i = 0; i < coordinates; ++i) point[i] = std::ldexp(point[i], power);
    return curve;
}

// ---- the tests

void CheckGraph(Exhibit const& piece)
{
    Curve const& curve = piece.curve;
    double const x0 = curve.p[0][0], x3 = curve.p[3][0], y0 = curve.p[0][1], y3 = curve.p[3][1];
    for (int i = 0; i <= 32; ++i) CheckSolve(curve, x0 + (x3 - x0) * i / 32);
    for (double const x : {-Infinite, -Huge, -1e9, std::nextafter(x0, x3), std::nextafter(x3, x0), 1e9, Infinite})
        CheckSolve(curve, x);
    bool const turns = !IsBetween(curve.p[1][0], x0, x3) || !IsBetween(curve.p[2][0], x0, x3) || x0 == x3;
    for (double const slope : {0.0, 1.0, 5.0, -3.0})
        if (!turns) CheckPlacesOfSlope(curve, slope);
    CheckNonDecreasing(curve);
    // Coordinates times a power of two give answers times a power of two, as long as nothing is denormal.
    for (int const power : {-1035, -600, -30, 30, 600, 900})
        for (double const share : {0.1, 0.5, 0.9}) {
            double const x = x0 + share * (x3 - x0);
            double const scaled = Ask(CRV_EvaluateYFromX, Scaled(curve, power, 1), std::ldexp(x, power));
            double const noise = power > -1000 ? 1e-9 * Size(curve, 1) : Huge;
            EXPECT_NEAR(Ask(CRV_EvaluateYFromX, curve, x), scaled, noise) << power;
        }
    if (y3 <= y0 || x0 == x3) return;
    Curve const growing = Treated(curve);
    for (int i = 1; i < 32; ++i) CheckInverse(growing, y0 + (y3 - y0) * i / 32);
    for (double const y : {-Infinite, y0 - 1, y0}) EXPECT_EQ(x0, Ask(CRV_EvaluateXFromY, growing, y));
    for (double const y : {Infinite, y3 + 1, y3}) EXPECT_EQ(x3, Ask(CRV_EvaluateXFromY, growing, y));
}

void CheckLengths(Exhibit const& piece)
{
    Curve curve = piece.curve;
    truth::Ruler const ruler(curve);
    double const polygon = static_cast<double>(ruler.polygon);
    EXPECT_LE(Table(curve, 1e-4 * polygon).Knots(), piece.mostKnots);
    CheckTable(curve, ruler, 1.0, 20);
    CheckTable(curve, ruler, 1e-3 * std::max(polygon, 1e-3), 500);
    CheckTable(curve, ruler, 1e-4, 50);
    CheckTable(curve, ruler, 1e-8 * std::max(polygon, 1.0), 50);
    CRV_Curve const kernel = curve.Get();
    Table table(curve, 1e-6);
    for (int i = 0; i <= 10; ++i) {  // without a table the curve itself is measured
        SEQ_Head** none = nullptr;
        double t = NaN;
        double const s = table.length * i / 10;
        ASSERT_EQ(0, CRV_TFromSSpline(&kernel, &none, &t, s, 1.0));
        EXPECT_EQ(nullptr, none);
        EXPECT_NEAR(table.T(s), t, 1e-4);
        EXPECT_DOUBLE_EQ(4.0 * table.T(s), table.T(s, 4.0)) << "the end is what the caller says";
    }
}

TEST(Curves, AnswerTheTruthOnTheWholeMuseum)
{
    for (Exhibit const& piece : Museum) {
        SCOPED_TRACE(piece.name);
        for (double const t : {-0.5, 0.0, 1e-9, 0.1, 0.25, 0.5, 0.77, 1.0, 1.0000001, 1e300})
            CheckPlace(piece.curve, t);
        CheckLengths(piece);
        if (piece.curve.dimension == 2) CheckGraph(piece);
    }
    EXPECT_EQ(0, Ask(CRV_EvaluateXFromY, Graph(2, 0.4, 0.4, 10, 10, 10, 10), 10)) << "all heights are equal";
    EXPECT_TRUE(PlacesOfSlope(Graph(1, 2, 2, 0, 1, 1, 0), 0).empty()) << "a hill where nobody comes by";
    EXPECT_TRUE(PlacesOfSlope({{{{3, 10}, {4, 11}, {2, 12}, {3, 20}}}}, 0).empty()) << "without extent in x";
    Curve loop = Exhibited("a loop");
    Table unit(loop, 1e-3);
    for (int const power : {-1000, -500, -20, 20, 500, 1000}) {
        Curve curve = Scaled(loop, power, 2);
        Table table(curve, std::ldexp(1e-3, power));
        EXPECT_EQ(unit.Knots(), table.Knots()) << power;
        EXPECT_EQ(unit.length, std::ldexp(table.length, -power)) << power;
        EXPECT_EQ(unit.T(0.3 * unit.length), table.T(0.3 * table.length)) << power;
    }
}

// Influences with 0 and 1 among them, folded curves of all sizes, and paths.
TEST(Curves, AnswerTheTruthAtRandom)
{
    Dice dice(11);
    for (int i = 0; i < Rounds(1500); ++i) {
        double const choices[] = {0.0, 1.0, dice.Between(0, 1), dice.Between(0, 1), dice.Between(-3, 4)};
        double const dt = dice.Between(0.01, 40) * (dice.Below(8) ? 1 : -1);
        Curve const curve = Graph(dt, choices[dice.Below(5)], choices[dice.Below(5)], dice.Between(-10, 10),
                                  dice.Between(-10, 10), dice.Between(-10, 10), dice.Between(-10, 10));
        SCOPED_TRACE(testing::Message() << curve);
        double const x = dt * dice.Between(0, 1);
        EXPECT_NEAR(x / dt, Ask(CRV_TFromX, Graph(dt, 1.0 / 3, 1.0 / 3, 0, 1, 2, 3), x), 4e-16) << "x is the parameter";
        CheckSolve(curve, x);
        CheckNonDecreasing(curve);

        double const height = dice.Between(0.1, 5), reach = dice.Below(4) ? 1 : 3;
        CheckInverse(Treated(Graph(1, dice.Between(0, reach), dice.Between(0, reach), 0, height * dice.Between(-1, 3),
                                   height * dice.Between(-2, 2), height)),
                     height * dice.Between(0, 1));

        Curve path;
        path.dimension = static_cast<short>(1 + i % 4);
        double const span = dice.Below(4) ? 100.0 : 100000.0;
        for (auto& point : path.p)
            std::generate_n(point.begin(), path.Size(), [&] { return dice.Between(-span, span); });
        if (i % 3 == 0)
            for (auto& point : path.p) point[0] = 0.1;
        std::size_t const from = static_cast<std::size_t>(dice.Below(8)), to = static_cast<std::size_t>(dice.Below(4));
        if (from < 4) path.p[to] = path.p[from];  // of which some coincide
        CheckPlace(path, dice.Between(0, 1));
        truth::Ruler const ruler(path);
        CheckTable(path, ruler, std::max(1e-4, 1e-7 * static_cast<double>(ruler.polygon)), 12);
    }
    int checked = 0;
    for (int i = 0; i < Rounds(2000); ++i)
        checked += CheckPlacesOfSlope(Graph(1, dice.Between(0.02, 1), dice.Between(0.02, 1), dice.Between(-1, 1),
                                            dice.Between(-1, 1), dice.Between(-1, 1), dice.Between(-1, 1)),
                                      dice.Below(2) ? 0.0 : dice.Between(-4, 4));
    EXPECT_GT(checked, Rounds(1900));
}

void CheckTableIsFinite(Curve curve, double accuracy)
{
    SCOPED_TRACE(testing::Message() << curve << ", accuracy " << accuracy);
    Table table(curve, accuracy);
    EXPECT_TRUE(std::isfinite(table.length) && table.length >= 0);
    for (double const share : {-1.0, 0.0, 1e-9, 0.3, 0.7, 1.0, 2.0})
        EXPECT_TRUE(IsBetween(table.T(share * table.length), 0, 1)) << share;
    EXPECT_EQ(table.length > 0 ? 1 : 0, table.T(Infinite));
}

TEST(Curves, AnyFiniteOneAnswersInsideItsHull)
{
    Dice dice(16);
    double const odd[] = {0.0, -0.0, Huge, -Huge, std::numeric_limits<double>::denorm_min(), 1.0};
    double const accuracies[] = {1e-4, 0.0, -1.0, NaN, 1e300, Infinite};
    for (int i = 0; i < Rounds(4000); ++i) {
        Curve curve;
        for (auto& point : curve.p)
            for (std::size_t k = 0; k < 2; ++k) point[k] = dice.Below(4) ? dice.Wild(307) : odd[dice.Below(6)];
        SCOPED_TRACE(testing::Message() << curve);
        double const share = dice.Between(0, 1), inside = (1 - share) * curve.p[0][0] + share * curve.p[3][0];
        for (double const x : {inside, dice.Wild(307), curve.p[static_cast<std::size_t>(dice.Below(4))][0]}) {
            auto const [low, high] = std::minmax({curve.p[0][1], curve.p[1][1], curve.p[2][1], curve.p[3][1]});
            EXPECT_TRUE(IsBetween(Ask(CRV_EvaluateYFromX, curve, x), low, high)) << x;
            EXPECT_TRUE(IsBetween(Ask(CRV_TFromX, curve, x), 0, 1)) << x;
            for (Operation const slope : {CRV_Evaluate1dDerivFromX, CRV_Evaluate1dDeriv2FromX})
                EXPECT_TRUE(std::isfinite(Ask(slope, curve, x))) << x;
        }
        for (double const x : PlacesOfSlope(curve, dice.Wild(20))) EXPECT_TRUE(std::isfinite(x));
        double vector[2];
        CRV_Curve const kernel = curve.Get();
        ASSERT_EQ(0, CRV_EvaluatePoint(&kernel, vector, share));
        EXPECT_TRUE(std::isfinite(vector[0]) && std::isfinite(vector[1]));
        Curve const after = Treated(curve);
        double const reach = 1.4 * std::max(std::fabs(curve.p[0][1]), std::fabs(curve.p[3][1]));
        for (std::size_t point : {1, 2})
            EXPECT_TRUE(after == curve || (std::isfinite(after.p[point][0]) && std::fabs(after.p[point][1]) <= reach));
        EXPECT_EQ(after, Treated(after));
        if (i % 4 != 0) continue;
        Curve path;
        path.dimension = static_cast<short>(1 + i / 4 % 4);
        for (auto& point : path.p)
            std::generate_n(point.begin(), path.Size(), [&] { return dice.Below(5) == 0 ? 0.0 : dice.Wild(306); });
        CheckTableIsFinite(path, accuracies[dice.Below(6)]);
    }
    for (Exhibit const& piece : Museum)
        for (int const power : {-1030, -1045, -1070}) CheckTableIsFinite(Scaled(piece.curve, power, 4), 1e-4);
}

TEST(Curves, AShortenedHandleKeepsItsSlopeAndLosesNoMoreThanNeeded)
{
    Dice dice(42);
    for (int i = 0; i < Rounds(3000); ++i) {
        double const inHeight = dice.Between(0.001, 1), outHeight = dice.Between(1, 5);
        Curve const before = Graph(1, 0.8, 0.3, 0, outHeight, 1 - inHeight, 1);
        Curve const after = Treated(before);
        EXPECT_NEAR(outHeight / 0.8, after.p[1][1] / after.p[1][0], 1e-12) << before;
        EXPECT_EQ(before.p[2], after.p[2]) << before;
        Curve longer = after;
        longer.p[1][1] *= 1.01;
        EXPECT_TRUE(before == after || truth::FallsBack(longer) > 0) << before << "-> " << after;
        double const out = dice.Between(-0.5, 3), in = dice.Between(-0.5, 3);
        Curve const a = Treated(Graph(1, 0.5, 0.5, 0, out, 1 - in, 1));
        Curve const b = Treated(Graph(1, 0.5, 0.5, 0, out + 1e-7, 1 - in + 1e-7, 1));
        for (std::size_t k : {1, 2}) EXPECT_NEAR(a.p[k][1], b.p[k][1], 1e-3) << "a small move moves it a little";
    }
}

// ---- tables one after the other

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
    Curve curve = Exhibited("a gentle arc");
    CRV_Curve const kernel = curve.Get();
    double const length = Table(curve, 1e-4).length;
    for (auto const& [itemSize, count] : {std::pair(8, 0), {8, 1}, {8, 3}, {8, 500}, {32, 0}, {32, 1}, {32, 3}}) {
        Table table(curve, 1e-4);  // and so it is where the list is one of something else, which is never read
        EXPECT_EQ(0, SEQ_Dispose(table.list, 0));
        ASSERT_EQ(0, SEQ_New(0, static_cast<short>(itemSize), 4, 1, &table.list));
        ASSERT_EQ(0, SEQ_SetNumItems(count, table.list, 0));
        double t = 77;
        EXPECT_EQ(SEQ_Err_BadList, CRV_TFromSSpline(&kernel, &table.list, &t, 1.0, 1.0));
        EXPECT_EQ(77, t);
        ASSERT_EQ(0, CRV_BuildArcSpline(&kernel, &table.list, &table.length, 1e-4));
        EXPECT_EQ(length, table.length);
        EXPECT_EQ(1, table.T(length));
    }
}

// Whether memory was refused; the result is then 4, and nothing is left.
bool NeedsMemory(Curve& curve, SEQ_Head**& list, int n)
{
    CRV_Curve const kernel = curve.Get();
    double length = 77;
    Q_FailAllocation(n);
    int const code = CRV_BuildArcSpline(&kernel, &list, &length, 1e-4);
    bool const fired = Q_FailAllocationFired();
    Q_FailAllocation(0);
    EXPECT_EQ(fired ? 4 : 0, code);
    EXPECT_TRUE(fired == (list == nullptr) && fired == (length == 0));
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
            EXPECT_FALSE(replacing && NeedsMemory(small, list, 0));
            fired = NeedsMemory(curve, list, failures + 1);
            EXPECT_EQ(0, list ? SEQ_Dispose(list, 0) : 0);
            EXPECT_EQ(before, Q_MemoryLive(nullptr));
        }
        EXPECT_GE(failures, 1);
    }
}

// ---- refusals

// Every operation in one form, with the dimensions that it takes and how many coordinates it looks at.
struct Refusing {
    char const* name;
    std::function<int(CRV_Curve*, double*, double)> call;
    int leastDimension, mostDimension;
    std::size_t coordinates = 2;
    bool takesArgument = true;
};

Refusing const Operations[] = {{"YFromX", CRV_EvaluateYFromX, 2, 2},
                               {"TFromX", CRV_TFromX, 1, 4, 1},
                               {"XFromY", CRV_EvaluateXFromY, 2, 2},
                               {"slope", CRV_Evaluate1dDerivFromX, 2, 2},
                               {"bend", CRV_Evaluate1dDeriv2FromX, 2, 2},
                               {"point", CRV_EvaluatePoint, 1, 4},
                               {"derivative", CRV_EvaluateDeriv, 1, 4},
                               {"split", CRV_SubdivideCurve, 1, 4},
                               {"places of a slope",
                                [](CRV_Curve* curve, double* xs, double slope) {
                                    int count = 5;
                                    int const code = CRV_EvaluateXFromYPrime(curve, &count, xs, slope);
                                    EXPECT_EQ(0, count);
                                    return code;
                                },
                                2, 2},
                               {"non-decreasing",
                                [](CRV_Curve* curve, double* answer, double) {
                                    unsigned char changed = 0;
                                    int const code = CRV_CurveSetNonDecreasing(curve, &changed);
                                    if (changed != 0) *answer = 0;
                                    return code;
                                },
                                2, 2, 2, false},
                               {"place at a length",
                                [](CRV_Curve* curve, double* t, double s) {
                                    SEQ_Head** none = nullptr;
                                    return CRV_TFromSSpline(curve, &none, t, s, 1.0);
                                },
                                1, 4},
                               {"table of lengths",
                                [](CRV_Curve* curve, double*, double) {
                                    Curve good = Exhibited("a loop");
                                    SEQ_Head** list = Table(good, 1e-4).Release();
                                    double length = 77;
                                    int const code = CRV_BuildArcSpline(curve, &list, &length, 1e-4);
                                    EXPECT_TRUE(!list && length == 0) << "a refusal leaves no table";
                                    return code;
                                },
                                1, 4, 2, false}};

TEST(CurveRefusals, BadInputIsNamedAndLeavesTheAnswerAlone)
{
    Curve const good = Graph(1, 0.5, 0.3, 0, 5, 1, 1);
    for (Refusing const& operation : Operations) {
        SCOPED_TRACE(operation.name);
        Curve curve = good;
        CRV_Curve kernel = curve.Get();
        double answers[20];
        std::fill_n(answers, 20, 77.0);
        EXPECT_EQ(CRV_Err_NullArgument, operation.call(nullptr, answers, 0.5));
        if (operation.takesArgument) {
            EXPECT_EQ(CRV_Err_NullArgument, operation.call(&kernel, nullptr, 0.5));
            EXPECT_EQ(CRV_Err_NotFinite, operation.call(&kernel, answers, NaN));
        }
        for (double* CRV_Curve::*point : {&CRV_Curve::p0, &CRV_Curve::p1, &CRV_Curve::p2, &CRV_Curve::p3}) {
            CRV_Curve broken = kernel;
            broken.*point = nullptr;
            EXPECT_EQ(CRV_Err_NullArgument, operation.call(&broken, answers, 0.5));
        }
        for (int const dimension : {-1, 0, 1, 3, 5}) {
            if (dimension >= operation.leastDimension && dimension <= operation.mostDimension) continue;
            if (dimension == 5 && operation.coordinates == 1) continue;  // any number, the first is taken
            CRV_Curve odd = kernel;
            odd.dimension = static_cast<short>(dimension);
            EXPECT_EQ(CRV_Err_Dimension, operation.call(&odd, answers, 0.5)) << dimension;
        }
        for (std::size_t i = 0; i < 8; ++i)
            for (double const bad : {NaN, Infinite, -Infinite}) {
                bool const isTreatment = operation.name == std::string_view("non-decreasing");
                if (i % 2 >= operation.coordinates || (isTreatment && !(i % 2 == 1 && std::isnan(bad)))) continue;
                curve.p[i / 2][i % 2] = bad;
                EXPECT_EQ(CRV_Err_NotFinite, operation.call(&kernel, answers, 0.5)) << "coordinate " << i;
                curve.p[i / 2][i % 2] = good.p[i / 2][i % 2];
                EXPECT_EQ(good, curve);
            }
        EXPECT_EQ(20, std::count(answers, answers + 20, 77.0));
    }
    Curve curve = good;
    CRV_Curve kernel = curve.Get();
    double xs[2];
    EXPECT_EQ(CRV_Err_NullArgument, CRV_EvaluateXFromYPrime(&kernel, nullptr, xs, 0));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_TFromSSpline(&kernel, nullptr, xs, 0, 1.0));
    EXPECT_EQ(CRV_Err_NullArgument, CRV_BuildArcSpline(&kernel, nullptr, xs, 1e-4));
    SEQ_Head** list = nullptr;
    EXPECT_EQ(CRV_Err_NullArgument, CRV_BuildArcSpline(&kernel, &list, nullptr, 1e-4));
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, nullptr));
    EXPECT_EQ(1, curve.p[1][1]) << "treated, though nobody wants to know";
    unsigned char changed = 9;
    EXPECT_EQ(0, CRV_CurveSetNonDecreasing(&kernel, &changed));
    EXPECT_EQ(9, changed) << "nothing left to do";
}

// ---- bits

TEST(Curves, BitsAreTheSameInEveryBuild)
{
    BitHash bits, lengths;
    Dice dice(99);
    for (int i = 0; i < 20000; ++i) {
        double const reach = i % 4 == 0 ? 2.0 : 1.0;
        double n[7];  // in an order of their own: that of arguments is the compiler's
        for (double& number : n) number = dice.Between(0, 1);
        Curve curve = Graph(0.1 + 9 * n[0], reach * n[1], reach * n[2], 9 * n[3], 9 * n[4], 9 * n[5], 9 * n[6]);
        double const x = dice.Between(0, curve.p[3][0]);
        for (Operation const solve : {CRV_EvaluateYFromX, CRV_Evaluate1dDerivFromX, CRV_Evaluate1dDeriv2FromX})
            bits.Mix(Ask(solve, curve, x));
        for (auto const& point : Treated(curve).p) bits.Mix(point[0] + point[1]);
    }
    EXPECT_EQ(14348890206054346473u, bits.hash);
    for (std::size_t piece = 0; piece < 18; ++piece) {
        Curve curve = Museum[piece].curve;
        Table table(curve, 1e-4);
        lengths.Mix(table.length);
        for (int i = 1; i < 100; ++i) lengths.Mix(table.T(0.01 * i * table.length));
    }
    EXPECT_EQ(7814949628796522789u, lengths.hash);
}

}  // namespace
