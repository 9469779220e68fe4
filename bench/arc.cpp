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
        const double s = 1.0 - t;
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

enum Family { kGentle, kRandom, kWithoutHandles, kNasty, kScreen };

std::vector<Segment> Segments(int family, int count)
{
    std::mt19937_64 engine(1);
    const auto unit = [&engine] { return static_cast<double>(engine() >> 11) * 0x1p-53; };
    std::vector<Segment> segments(static_cast<std::size_t>(count));
    for (Segment& segment : segments)
        for (std::size_t i = 0; i < 2; ++i) {
            auto& p = segment.points;
            for (auto& point : p) point[i] = unit();
            if (family == kGentle || family == kScreen) {
                p[1][i] = p[0][i] + (p[3][i] - p[0][i]) / 3.0 + 0.2 * (unit() - 0.5);
                p[2][i] = p[3][i] - (p[3][i] - p[0][i]) / 3.0 + 0.2 * (unit() - 0.5);
            } else if (family == kWithoutHandles) {
                p[1][i] = p[0][i];
                p[2][i] = p[3][i];
            } else if (family == kNasty) {
                p[3][i] = p[0][i] + 1e-3 * unit();
            }
            if (family == kScreen)
                for (auto& point : p) point[i] *= 1000.0;
        }
    return segments;
}

constexpr std::size_t kSteps = 64;
using UniformTable = std::array<double, kSteps + 1>;

double Chord(std::array<double, 2> const& a, std::array<double, 2> const& b)
{
    const double dx = b[0] - a[0];
    const double dy = b[1] - a[1];
    return std::sqrt(dx * dx + dy * dy);
}

void BuildUniform(Segment const& segment, UniformTable& table)
{
    auto before = segment.At(0.0);
    table[0] = 0.0;
    for (std::size_t i = 1; i <= kSteps; ++i) {
        const auto point = segment.At(static_cast<double>(i) / kSteps);
        table[i] = table[i - 1] + Chord(before, point);
        before = point;
    }
}

double UniformT(UniformTable const& table, double s)
{
    const auto next = std::upper_bound(table.begin() + 1, table.end() - 1, s);
    const double low = next[-1];
    const double share = *next > low ? (s - low) / (*next - low) : 0.0;
    return (static_cast<double>(next - table.begin() - 1) + share) / kSteps;
}

struct OurTable {
    SEQ_Head** list = nullptr;
    double length = 0.0;

    OurTable() = default;
    OurTable(OurTable const&) = delete;
    OurTable& operator=(OurTable const&) = delete;
    ~OurTable() { Clear(); }
    void Build(CRV_Curve const& curve) { CRV_BuildArcSpline(&curve, &list, &length, 1e-4); }
    void Clear()
    {
        if (list) SEQ_Dispose(list, 0);
        list = nullptr;
    }
};

// The largest difference between the distance asked and the one reached, as a share of the polygon.
template <class T>
double WorstError(Segment const& segment, double length, T&& tOf)
{
    constexpr int kChords = 20000;
    std::vector<double> sums(kChords + 1, 0.0);
    auto before = segment.At(0.0);
    for (int i = 1; i <= kChords; ++i) {
        const auto point = segment.At(static_cast<double>(i) / kChords);
        sums[static_cast<std::size_t>(i)] = sums[static_cast<std::size_t>(i) - 1] + Chord(before, point);
        before = point;
    }
    double worst = 0.0;
    for (int i = 0; i <= 200; ++i) {
        const double s = length * i / 200;
        const double place = std::min(tOf(s) * kChords, kChords - 1e-9);
        const std::size_t k = static_cast<std::size_t>(place);
        const double reached = sums[k] + (place - static_cast<double>(k)) * (sums[k + 1] - sums[k]);
        worst = std::max(worst, std::fabs(reached - s));
    }
    return worst / segment.Polygon();
}

constexpr int kBesideKnots = 2;  // items of a table that aren't knots

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

    const long long empty = Q_MemoryLive(nullptr).bytes;
    double knots = 0.0;
    double bytes = 0.0;
    double worst = 0.0;
    for (std::size_t k = 0; k < segments.size(); ++k) {
        const CRV_Curve curve = segments[k].Curve();
        table.Clear();
        table.Build(curve);
        knots += (*table.list)->count - kBesideKnots;
        bytes += static_cast<double>(Q_MemoryLive(nullptr).bytes - empty);
        if (k < 100)
            worst = std::max(worst, WorstError(segments[k], table.length, [&](double s) {
                                 double t = 0.0;
                                 CRV_TFromSSpline(&curve, &table.list, &t, s, 1.0);
                                 return t;
                             }));
    }
    state.counters["knots"] = knots / static_cast<double>(segments.size());
    state.counters["bytes"] = bytes / static_cast<double>(segments.size());
    state.counters["worst"] = worst;
}

void BuildYardstick(benchmark::State& state)
{
    const std::vector<Segment> segments = Segments(static_cast<int>(state.range(0)), 1 << 10);
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
        worst = std::max(worst, WorstError(segments[k], table[kSteps], [&](double s) { return UniformT(table, s); }));
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
    const CRV_Curve curve = segment.Curve();
    OurTable table;
    table.Build(curve);
    const std::vector<double> distances = Distances(table.length);
    std::size_t i = 0;
    for (auto _ : state) {
        double t = 0.0;
        CRV_TFromSSpline(&curve, &table.list, &t, distances[i], 1.0);
        benchmark::DoNotOptimize(t);
        i = (i + 1) & (distances.size() - 1);
    }
}

void LookupYardstick(benchmark::State& state)
{
    const Segment segment = Segments(static_cast<int>(state.range(0)), 1)[0];
    UniformTable table;
    BuildUniform(segment, table);
    const std::vector<double> distances = Distances(table[kSteps]);
    std::size_t i = 0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(UniformT(table, distances[i]));
        i = (i + 1) & (distances.size() - 1);
    }
}

BENCHMARK(BuildOurs<true>)->Name("build/ours")->ArgName("family")->DenseRange(kGentle, kScreen);
BENCHMARK(BuildYardstick)->Name("build/yardstick")->ArgName("family")->DenseRange(kGentle, kScreen);
BENCHMARK(BuildOurs<false>)->Name("rebuild/ours")->ArgName("family")->DenseRange(kGentle, kScreen);
BENCHMARK(BuildYardstick)->Name("rebuild/yardstick")->ArgName("family")->DenseRange(kGentle, kScreen);
BENCHMARK(LookupOurs)->Name("lookup/ours")->ArgName("family")->DenseRange(kGentle, kScreen);
BENCHMARK(LookupYardstick)->Name("lookup/yardstick")->ArgName("family")->DenseRange(kGentle, kScreen);

}  // namespace
