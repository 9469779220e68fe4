// Tables from distance to parameter: building one, and looking up.
//
// The yardstick is a table of 64 equal steps of the parameter, chord lengths added up and interpolated between: quick
// to read, and off. Both sides count their largest error ("worst", as a share of the polygon's length) against a sum of
// 20,000 chords, and what a table takes ("bytes"; ours with the list that holds it, and its "knots"). A rebuild is what
// a drag does: the next segment's table in the place of the last one's.
//
// The segments are about as large as 1, so that an accuracy of 1e-4 is one of their size; those of the last family are
// as large as a screen, and measured a hundred times more finely for it.

#include "frame/services/curvekernel.h"
#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <array>
#include <cmath>
#include <random>
#include <vector>

namespace {

struct Segment {
    std::array<std::array<double, 2>, 4> points;

    CRV_Curve Curve() { return {2, points[0].data(), points[1].data(), points[2].data(), points[3].data()}; }
    std::array<double, 2> At(double t) const
    {
        double const s = 1.0 - t;
        std::array<double, 2> point;
        for (std::size_t i = 0; i < 2; ++i)
            point[i] = s * s * s * points[0][i] + 3.0 * s * s * t * points[1][i] + 3.0 * s * t * t * points[2][i] +
                       t * t * t * points[3][i];
        return point;
    }
    double Polygon() const
    {
        double sum = 0.0;
        for (std::size_t k = 0; k < 3; ++k)
            sum += std::hypot(points[k + 1][0] - points[k][0], points[k + 1][1] - points[k][1]);
        return sum;
    }
};

enum Family { Gentle, Random, WithoutHandles, Nasty, Screen };

std::vector<Segment> Segments(int family, int count)
{
    std::mt19937_64 engine(1);
    auto const unit = [&engine] { return static_cast<double>(engine() >> 11) * 0x1p-53; };
    std::vector<Segment> segments(static_cast<std::size_t>(count));
    for (Segment& segment : segments)
        for (std::size_t i = 0; i < 2; ++i) {
            auto& p = segment.points;
            for (auto& point : p) point[i] = unit();
            if (family == Gentle || family == Screen) {
                p[1][i] = p[0][i] + (p[3][i] - p[0][i]) / 3.0 + 0.2 * (unit() - 0.5);
                p[2][i] = p[3][i] - (p[3][i] - p[0][i]) / 3.0 + 0.2 * (unit() - 0.5);
            } else if (family == WithoutHandles) {
                p[1][i] = p[0][i];
                p[2][i] = p[3][i];
            } else if (family == Nasty) {
                p[3][i] = p[0][i] + 1e-3 * unit();
            }
            if (family == Screen)
                for (auto& point : p) point[i] *= 1000.0;
        }
    return segments;
}

constexpr std::size_t Steps = 64;
using UniformTable = std::array<double, Steps + 1>;

double Chord(std::array<double, 2> const& a, std::array<double, 2> const& b)
{
    double const dx = b[0] - a[0];
    double const dy = b[1] - a[1];
    return std::sqrt(dx * dx + dy * dy);
}

void BuildUniform(Segment const& segment, UniformTable& table)
{
    auto before = segment.At(0.0);
    table[0] = 0.0;
    for (std::size_t i = 1; i <= Steps; ++i) {
        auto const point = segment.At(static_cast<double>(i) / Steps);
        table[i] = table[i - 1] + Chord(before, point);
        before = point;
    }
}

double UniformT(UniformTable const& table, double s)
{
    auto const next = std::upper_bound(table.begin() + 1, table.end() - 1, s);
    double const low = next[-1];
    double const share = *next > low ? (s - low) / (*next - low) : 0.0;
    return (static_cast<double>(next - table.begin() - 1) + share) / Steps;
}

struct OurTable {
    SEQ_Head** list = nullptr;
    double length = 0.0;

    OurTable() = default;
    OurTable(OurTable const&) = delete;
    OurTable& operator=(OurTable const&) = delete;
    ~OurTable() { Clear(); }
    // Codes are ignored here, so that the time is that of the call alone.
    void Build(CRV_Curve const& curve) { static_cast<void>(CRV_BuildArcSpline(&curve, &list, &length, 1e-4)); }
    void Clear()
    {
        if (list) static_cast<void>(SEQ_Dispose(list, 0));
        list = nullptr;
    }
};

// The largest difference between the distance asked and the one reached, as a share of the polygon.
template <class T>
double WorstError(Segment const& segment, double length, T&& tOf)
{
    constexpr int Chords = 20000;
    std::vector<double> sums(Chords + 1, 0.0);
    auto before = segment.At(0.0);
    for (int i = 1; i <= Chords; ++i) {
        auto const point = segment.At(static_cast<double>(i) / Chords);
        sums[static_cast<std::size_t>(i)] = sums[static_cast<std::size_t>(i) - 1] + Chord(before, point);
        before = point;
    }
    double worst = 0.0;
    for (int i = 0; i <= 200; ++i) {
        double const s = length * i / 200;
        double const place = std::min(tOf(s) * Chords, Chords - 1e-9);
        std::size_t const k = static_cast<std::size_t>(place);
        double const reached = sums[k] + (place - static_cast<double>(k)) * (sums[k + 1] - sums[k]);
        worst = std::max(worst, std::fabs(reached - s));
    }
    return worst / segment.Polygon();
}

constexpr int BesideKnots = 2;  // items of a table that aren't knots

template <bool fresh>
void BuildOurs(benchmark::State& state)
{
    std::vector<Segment> segments = Segments(static_cast<int>(state.range(0)), 1 << 10);
    std::size_t i = 0;
    OurTable table;
    for (auto _ : state) {
        if (fresh) table.Clear();
        table.Build(segments[i].Curve());
        benchmark::DoNotOptimize(table.length);
        i = (i + 1) & (segments.size() - 1);
    }
    table.Clear();

    long long const empty = Q_MemoryLive(nullptr).bytes;
    double knots = 0.0;
    double bytes = 0.0;
    double worst = 0.0;
    for (std::size_t k = 0; k < segments.size(); ++k) {
        CRV_Curve const curve = segments[k].Curve();
        table.Clear();
        table.Build(curve);
        knots += (*table.list)->count - BesideKnots;
        bytes += static_cast<double>(Q_MemoryLive(nullptr).bytes - empty);
        if (k < 100)
            worst = std::max(worst, WorstError(segments[k], table.length, [&](double s) {
                                 double t = 0.0;
                                 static_cast<void>(CRV_TFromSSpline(&curve, &table.list, &t, s, 1.0));
                                 return t;
                             }));
    }
    state.counters["knots"] = knots / static_cast<double>(segments.size());
    state.counters["bytes"] = bytes / static_cast<double>(segments.size());
    state.counters["worst"] = worst;
}

void BuildYardstick(benchmark::State& state)
{
    std::vector<Segment> const segments = Segments(static_cast<int>(state.range(0)), 1 << 10);
    std::size_t i = 0;
    UniformTable table;
    for (auto _ : state) {
        BuildUniform(segments[i], table);
        benchmark::DoNotOptimize(table);
        i = (i + 1) & (segments.size() - 1);
    }
    double worst = 0.0;
    for (std::size_t k = 0; k < 100; ++k) {
        BuildUniform(segments[k], table);
        worst = std::max(worst, WorstError(segments[k], table[Steps], [&](double s) { return UniformT(table, s); }));
    }
    state.counters["bytes"] = sizeof table;
    state.counters["worst"] = worst;
}

std::vector<double> Distances(double length)
{
    std::mt19937_64 engine(2);
    std::vector<double> distances(1 << 14);
    for (double& distance : distances) distance = length * (static_cast<double>(engine() >> 11) * 0x1p-53);
    return distances;
}

void LookupOurs(benchmark::State& state)
{
    Segment segment = Segments(static_cast<int>(state.range(0)), 1)[0];
    CRV_Curve const curve = segment.Curve();
    OurTable table;
    table.Build(curve);
    std::vector<double> const distances = Distances(table.length);
    std::size_t i = 0;
    for (auto _ : state) {
        double t = 0.0;
        static_cast<void>(CRV_TFromSSpline(&curve, &table.list, &t, distances[i], 1.0));
        benchmark::DoNotOptimize(t);
        i = (i + 1) & (distances.size() - 1);
    }
}

void LookupYardstick(benchmark::State& state)
{
    Segment const segment = Segments(static_cast<int>(state.range(0)), 1)[0];
    UniformTable table;
    BuildUniform(segment, table);
    std::vector<double> const distances = Distances(table[Steps]);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(UniformT(table, distances[i]));
        i = (i + 1) & (distances.size() - 1);
    }
}

BENCHMARK(BuildOurs<true>)->Name("build/ours")->ArgName("family")->DenseRange(Gentle, Screen);
BENCHMARK(BuildYardstick)->Name("build/yardstick")->ArgName("family")->DenseRange(Gentle, Screen);
BENCHMARK(BuildOurs<false>)->Name("rebuild/ours")->ArgName("family")->DenseRange(Gentle, Screen);
BENCHMARK(BuildYardstick)->Name("rebuild/yardstick")->ArgName("family")->DenseRange(Gentle, Screen);
BENCHMARK(LookupOurs)->Name("lookup/ours")->ArgName("family")->DenseRange(Gentle, Screen);
BENCHMARK(LookupYardstick)->Name("lookup/yardstick")->ArgName("family")->DenseRange(Gentle, Screen);

}  // namespace
