// Dragging a curve by one of its points, and walking a polyline of it.

#include "bench/common.h"
#include "curves/adaptivesamples.h"
#include "curves/manipulate.h"
#include "curves/tangents.h"
#include "keystore/edit.h"

#include <benchmark/benchmark.h>

#include <memory>

namespace {

constexpr unsigned int Scale = 600;
constexpr int Gap = 100;

std::unique_ptr<KFS_Stream> MakeStream(int keys)
{
    Library();
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    auto stream = std::make_unique<KFS_Stream>(1, Scale, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
    for (int i = 0; i < keys; ++i) {
        T_Time const at{i * Gap, Scale};
        double const value = i % 7;
        Must(KFS_InsertKey(stream.get(), &at, 1, &value, KFS_Interp_Spline, KFS_Interp_Spline));
    }
    return stream;
}

// There and back again in the middle of the stream, as a hand does it.
void DragOurs(benchmark::State& state)
{
    int const keys = static_cast<int>(state.range(0));
    std::unique_ptr<KFS_Stream> const stream = MakeStream(keys);
    T_Time at{keys / 2 * Gap + 40, Scale};
    double change = 0.5;
    for (auto _ : state) {
        change = -change;
        benchmark::DoNotOptimize(KFS_DirectManipArc(stream.get(), &at, 0, 0, &change));
    }
}

// The solve for the parameter that is dragged, and the two handles set.
void DragYardstick(benchmark::State& state)
{
    int const keys = static_cast<int>(state.range(0));
    std::unique_ptr<KFS_Stream> const stream = MakeStream(keys);
    double points[4][2] = {{0.0, 1.0}, {0.03, 1.5}, {0.13, 1.7}, {100.0 / Scale, 2.0}};
    CRV_Curve const curve{2, points[0], points[1], points[2], points[3]};
    double out[] = {0.03, 0.5};
    double in[] = {-0.03, -0.3};
    double* const none = nullptr;
    double x = 40.0 / Scale;
    for (auto _ : state) {
        double t = 0.0;
        benchmark::DoNotOptimize(x);
        benchmark::DoNotOptimize(CRV_TFromX(&curve, &t, x));
        benchmark::DoNotOptimize(t);
        benchmark::DoNotOptimize(KFS_SetKeyTangentsF(stream.get(), keys / 2, none, none, &out[0], &out[1], 1.0));
        benchmark::DoNotOptimize(KFS_SetKeyTangentsF(stream.get(), keys / 2 + 1, &in[0], &in[1], none, none, 1.0));
    }
}

// Steps inside one segment.
constexpr double Step = 1.0 / 48000;

void WalkOurs(benchmark::State& state)
{
    KFS_AdaptiveSampleStream polyline;
    Must(SEQ_New(0, 2 * sizeof(double), 4, 1, &polyline.samples));
    for (double const end : {0.0, 1e9}) {
        double const sample[] = {end, 0.5 * end};
        Must(SEQ_Insert(sample, -1, polyline.samples));
    }
    KFS_AdaptiveSampleStreamCache cache;
    double* samples = nullptr;
    int count = 0;
    int next = 0;
    Must(KFS_InitIterateAdaptiveSampleStream(&polyline, &samples, &count, &next, &cache));
    double x = 0.0;
    double slope = 0.0;
    double value = 0.0;
    for (auto _ : state) {
        static_cast<void>(KFS_IterateAdaptiveSampleStream(x, Step, &polyline, samples, count, &next, &cache,
                                                          state.range(0) ? &slope : nullptr, &value));
        x += Step;
        benchmark::DoNotOptimize(value);
        benchmark::DoNotOptimize(slope);
    }
    Must(KFS_CompleteIterateAdaptiveSampleStream(&polyline));
    Must(SEQ_Dispose(polyline.samples, 0));
}

void WalkYardstick(benchmark::State& state)
{
    double value = 0.0;
    for (auto _ : state) {
        value += 0.5 * Step;
        benchmark::DoNotOptimize(value);
    }
}

BENCHMARK(DragOurs)->Name("drag/ours")->ArgName("keys")->Arg(10)->Arg(10000);
BENCHMARK(DragYardstick)->Name("drag/yardstick")->ArgName("keys")->Arg(10)->Arg(10000);
BENCHMARK(WalkOurs)->Name("walk_polyline/ours")->ArgName("slope")->DenseRange(0, 1);
BENCHMARK(WalkYardstick)->Name("walk_polyline/yardstick")->ArgName("slope")->DenseRange(0, 1);

}  // namespace
