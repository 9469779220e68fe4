// The solve and its relatives, on curves from an array that no branch predictor can learn.
//
// The yardstick of the solve is the textbook's: Newton steps inside a bracket, bisection where they leave it, until the
// parameter is known to 1e-12. Both sides count their largest residual in x over a million curves ("worst_x") and the
// largest error of y, for influences of a tenth and more ("worst_y"), against bisection in long double.

#include "frame/services/curvekernel.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <random>
#include <vector>

namespace {

struct Question {
    std::array<std::array<double, 2>, 4> points;
    double x;

    CRV_Curve Curve() { return {2, points[0].data(), points[1].data(), points[2].data(), points[3].data()}; }
};

enum Family { Random, ZeroAndOne, Moderate, Thirds };

std::vector<Question> Questions(Family family, int count)
{
    std::mt19937_64 engine(1);
    auto const unit = [&engine] { return static_cast<double>(engine() >> 11) * 0x1p-53; };
    std::vector<Question> questions(static_cast<std::size_t>(count));
    for (Question& question : questions) {
        double const dt = 0.1 + 4.0 * unit();
        double out = unit();
        double in = unit();
        if (family == ZeroAndOne) {
            double const choices[] = {0.0, 1.0, out};
            out = choices[engine() % 3];
            in = choices[engine() % 3];
        } else if (family == Moderate) {
            out = 0.1 + 0.5 * out;
            in = 0.1 + 0.5 * in;
        } else if (family == Thirds) {
            out = in = 1.0 / 3.0;
        }
        question.points[0] = {0.0, unit()};
        question.points[1] = {out * dt, unit()};
        question.points[2] = {dt - in * dt, unit()};
        question.points[3] = {dt, unit()};
        question.x = dt * unit();
    }
    return questions;
}

template <class Real>
Real Blend(Question const& question, std::size_t i, Real t)
{
    Real const s = 1 - t;
    return s * s * s * question.points[0][i] + 3 * s * s * t * question.points[1][i] +
           3 * s * t * t * question.points[2][i] + t * t * t * question.points[3][i];
}

double TextbookT(Question const& question)
{
    double const x1 = question.points[1][0];
    double const x2 = question.points[2][0];
    double const x3 = question.points[3][0];
    double low = 0.0;
    double high = 1.0;
    double t = question.x / x3;
    for (int step = 0; step < 100; ++step) {
        double const s = 1.0 - t;
        double const f = 3.0 * s * s * t * x1 + 3.0 * s * t * t * x2 + t * t * t * x3 - question.x;
        (f < 0.0 ? low : high) = t;
        double const slope = 3.0 * (s * s * x1 + 2.0 * s * t * (x2 - x1) + t * t * (x3 - x2));
        double next = t - f / slope;
        if (!(next >= low && next <= high)) next = 0.5 * (low + high);
        if (std::fabs(next - t) < 1e-12) return next;
        t = next;
    }
    return t;
}

double TextbookY(Question& question)
{
    return Blend(question, 1, TextbookT(question));
}

// Ours ignores the codes, so that the time is that of the call alone.
double OurT(Question& question)
{
    CRV_Curve const curve = question.Curve();
    double t = 0.0;
    static_cast<void>(CRV_TFromX(&curve, &t, question.x));
    return t;
}

double OurY(Question& question)
{
    CRV_Curve const curve = question.Curve();
    double y = 0.0;
    static_cast<void>(CRV_EvaluateYFromX(&curve, &y, question.x));
    return y;
}

// The worst case over a million curves, once.
template <class T, class Y>
void CountErrors(benchmark::State& state, T&& tOf, Y&& yOf)
{
    double worstX = 0.0;
    double worstY = 0.0;
    for (Question& question : Questions(static_cast<Family>(state.range(0)), 1000000)) {
        long double const t = tOf(question);
        double const dt = question.points[3][0];
        long double const residual = std::fabs(Blend(question, 0, t) - question.x) / dt;
        worstX = std::max(worstX, static_cast<double>(residual));
        if (state.range(0) != Moderate) continue;
        long double low = 0;
        long double high = 1;
        for (int half = 0; half < 64; ++half) {
            long double const middle = (low + high) / 2;
            (Blend(question, 0, middle) < question.x ? low : high) = middle;
        }
        worstY = std::max(worstY, static_cast<double>(std::fabs(Blend(question, 1, low) - yOf(question))));
    }
    state.counters["worst_x"] = worstX;
    if (state.range(0) == Moderate) state.counters["worst_y"] = worstY;
}

template <class Solve>
void Run(benchmark::State& state, Solve&& solve)
{
    std::vector<Question> questions = Questions(static_cast<Family>(state.range(0)), 1 << 14);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(solve(questions[i]));
        i = (i + 1) & (questions.size() - 1);
    }
}

void SolveOurs(benchmark::State& state)
{
    Run(state, OurY);
    CountErrors(state, OurT, OurY);
}

void SolveYardstick(benchmark::State& state)
{
    Run(state, TextbookY);
    CountErrors(state, TextbookT, TextbookY);
}

void SlopeOurs(benchmark::State& state)
{
    Run(
        state,
        [](Question& question) {
            CRV_Curve const curve = question.Curve();
            double slope = 0.0;
            static_cast<void>(CRV_Evaluate1dDerivFromX(&curve, &slope, question.x));
            return slope;
        });
}

void SlopeYardstick(benchmark::State& state)
{
    Run(
        state,
        [](Question& question) {
            double const t = TextbookT(question);
            double const s = 1.0 - t;
            double slopes[2];
            for (std::size_t i = 0; i < 2; ++i)
                slopes[i] = s * s * (question.points[1][i] - question.points[0][i]) +
                            2.0 * s * t * (question.points[2][i] - question.points[1][i]) +
                            t * t * (question.points[3][i] - question.points[2][i]);
            return slopes[1] / slopes[0];
        });
}

// The treatment on curves of which all, or none, are already as they should be. The yardstick copies the points, which
// ours has to do as well to have something to treat.
template <bool Treat>
void NonDecreasing(benchmark::State& state)
{
    std::vector<Question> questions = Questions(Random, 1 << 14);
    for (Question& question : questions) {
        auto& p = question.points;
        p[3][1] = p[0][1] + 1.0;
        p[1][1] = p[0][1] + (state.range(0) ? 1.5 + p[1][1] : p[1][1]);
        p[2][1] = p[3][1] - p[2][1];
    }
    std::size_t i = 0;
    for (auto _ : state) {
        Question question = questions[i];
        CRV_Curve curve = question.Curve();
        if (Treat) static_cast<void>(CRV_CurveSetNonDecreasing(&curve, nullptr));
        benchmark::DoNotOptimize(question);
        i = (i + 1) & (questions.size() - 1);
    }
}

BENCHMARK(SolveOurs)->Name("solve/ours")->ArgName("family")->DenseRange(Random, Thirds);
BENCHMARK(SolveYardstick)->Name("solve/yardstick")->ArgName("family")->DenseRange(Random, Thirds);
BENCHMARK(SlopeOurs)->Name("slope/ours")->ArgName("family")->DenseRange(Random, ZeroAndOne);
BENCHMARK(SlopeYardstick)->Name("slope/yardstick")->ArgName("family")->DenseRange(Random, ZeroAndOne);
BENCHMARK(NonDecreasing<true>)->Name("nondecreasing/ours")->ArgName("work")->DenseRange(0, 1);
BENCHMARK(NonDecreasing<false>)->Name("nondecreasing/yardstick")->ArgName("work")->DenseRange(0, 1);

}  // namespace
