// Points that move along paths: reads beside a bare search, speed-graph solve and table lookup; the repair after an
// edit; a drag.

#include "bench/common.h"
#include "curves/derivatives.h"
#include "curves/spacetangents.h"
#include "frame/services/curvekernel.h"
#include "frame/services/sequence.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"

#include <benchmark/benchmark.h>

#include <map>
#include <memory>
#include <random>
#include <vector>

namespace {

constexpr unsigned int Scale = 600;
constexpr int Gap = 100;
constexpr int Asked = 4096;
constexpr short Dimension = 3;

std::unique_ptr<KFS_Stream> MakePath(int keys, unsigned int seed)
{
    Library();
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    auto stream = std::make_unique<KFS_Stream>(Dimension, Scale, 0, 1, KFS_InterpMask_All, KFS_InterpMask_Negative,
                                               desc, nullptr, nullptr, false);
    std::mt19937 random(seed);
    std::uniform_real_distribution<double> step(-50.0, 50.0);
    double point[Dimension] = {};
    for (int i = 0; i < keys; ++i) {
        for (double& coordinate : point) coordinate += step(random);
        T_Time const at{i * Gap, Scale};
        Must(KFS_InsertKey(stream.get(), &at, 1, point, KFS_Interp_Spline, KFS_Interp_Spline));
    }
    return stream;
}

// A path that is up to date, and the same segments as bare curves with tables of their own.
struct Fixture {
    struct Segment {
        double speed[4][2];
        double path[4][Dimension];
        SEQ_Head** table = nullptr;
        double length = 0.0;
    };

    explicit Fixture(int keys) : stream(MakePath(keys, 3))
    {
        double value[Dimension];
        T_Time const at{Gap / 2, Scale};
        Must(KFS_GetValueFPlus(stream.get(), &at, 0, value, nullptr, nullptr));
        SEQ_Head** const list = stream->GetKeys();
        for (int i = 0; i < keys; ++i) {
            void const* item = nullptr;
            Must(SEQ_GetConstAddress(list, i, &item));
            records.push_back(static_cast<KFS_KeyScalar const*>(item));
            times.push_back(records.back()->time);
        }
        for (std::size_t i = 0; i + 1 < records.size(); ++i)
            segments.push_back(MakeSegment(*records[i], *records[i + 1]));
    }
    ~Fixture()
    {
        for (Segment const& segment : segments) static_cast<void>(SEQ_Dispose(segment.table, 0));
    }
    Fixture(Fixture const&) = delete;
    Fixture& operator=(Fixture const&) = delete;

    static double const* Numbers(KFS_KeyScalar const& key)
    {
        return reinterpret_cast<double const*>(reinterpret_cast<char const*>(&key) + KFS_KeySpatialHeadSize);
    }

    static Segment MakeSegment(KFS_KeyScalar const& a, KFS_KeyScalar const& b)
    {
        Segment made;
        for (int d = 0; d < Dimension; ++d) {
            made.path[0][d] = Numbers(a)[d];
            made.path[1][d] = Numbers(a)[d] + Numbers(a)[2 * Dimension + d];
            made.path[2][d] = Numbers(b)[d] + Numbers(b)[Dimension + d];
            made.path[3][d] = Numbers(b)[d];
        }
        CRV_Curve const path{Dimension, made.path[0], made.path[1], made.path[2], made.path[3]};
        Must(CRV_BuildArcSpline(&path, &made.table, &made.length, 0.0001));
        double const dt = static_cast<double>(Gap) / Scale;
        double const points[4][2] = {{0.0, 0.0},
                                     {a.outInfluence * dt, a.outInfluence * dt * a.outSpeed},
                                     {dt - b.inInfluence * dt, made.length - b.inInfluence * dt * b.inSpeed},
                                     {dt, made.length}};
        std::copy(&points[0][0], &points[0][0] + 8, &made.speed[0][0]);
        CRV_Curve speed{2, made.speed[0], made.speed[1], made.speed[2], made.speed[3]};
        Must(CRV_CurveSetNonDecreasing(&speed, nullptr));
        return made;
    }

    std::unique_ptr<KFS_Stream> stream;
    std::vector<KFS_KeyScalar const*> records;
    std::vector<int> times;
    std::vector<Segment> segments;
};

Fixture& Get(int keys)
{
    static std::map<int, std::unique_ptr<Fixture>> made;
    std::unique_ptr<Fixture>& fixture = made[keys];
    if (!fixture) fixture = std::make_unique<Fixture>(keys);
    return *fixture;
}

std::vector<int> RandomTimes(int keys)
{
    std::mt19937 random(7);
    std::vector<int> asked;
    for (int i = 0; i < Asked; ++i) {
        int const time = static_cast<int>(random() % static_cast<unsigned>((keys - 1) * Gap));
        asked.push_back(time % Gap == 0 ? time + 1 : time);
    }
    return asked;
}

void ReadOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(static_cast<int>(state.range(0)));
    std::vector<int> const asked = RandomTimes(static_cast<int>(state.range(0)));
    double point[Dimension];
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(fixture.stream.get(), &at, 0, point, nullptr, nullptr));
        benchmark::DoNotOptimize(point);
    }
}
void ReadYardstick(benchmark::State& state)
{
    Fixture& fixture = Get(static_cast<int>(state.range(0)));
    std::vector<int> const asked = RandomTimes(static_cast<int>(state.range(0)));
    double point[Dimension];
    std::size_t i = 0;
    for (auto _ : state) {
        int const time = asked[i++ % Asked];
        auto const index = static_cast<std::size_t>(Search(fixture.times, time) - 1);
        Fixture::Segment& segment = fixture.segments[index];
        CRV_Curve const speed{2, segment.speed[0], segment.speed[1], segment.speed[2], segment.speed[3]};
        double distance = 0.0;
        static_cast<void>(
            CRV_EvaluateYFromX(&speed, &distance, static_cast<double>(time - fixture.times[index]) / Scale));
        CRV_Curve const path{Dimension, segment.path[0], segment.path[1], segment.path[2], segment.path[3]};
        double t = 0.0;
        static_cast<void>(CRV_TFromSSpline(&path, &segment.table, &t, distance, 1.0));
        static_cast<void>(CRV_EvaluatePoint(&path, point, t));
        benchmark::DoNotOptimize(point);
    }
}
BENCHMARK(ReadOurs)->Name("read_path_random/ours")->Arg(8)->Arg(1000)->Arg(30000);
BENCHMARK(ReadYardstick)->Name("read_path_random/yardstick")->Arg(8)->Arg(1000)->Arg(30000);

// The speed there, beside the place.
void RateOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(static_cast<int>(state.range(0)));
    std::vector<int> const asked = RandomTimes(static_cast<int>(state.range(0)));
    double speed = 0.0;
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(
            KFS_GetDeriv(fixture.stream.get(), &at, KFS_Deriv_Velocity, 0, 0, &speed, nullptr, nullptr, {}, {}));
        benchmark::DoNotOptimize(speed);
    }
}
BENCHMARK(RateOurs)->Name("rate_path_random/ours")->Arg(1000);
BENCHMARK(ReadOurs)->Name("rate_path_random/yardstick")->Arg(1000);

// A value moved in the middle and the read beside it, which measures the arcs anew. The yardstick has ten keys: the
// cost must not grow with their number.
void EditAndRead(benchmark::State& state, int keys)
{
    std::unique_ptr<KFS_Stream> const stream = MakePath(keys, 3);
    T_Time const beside{keys / 2 * Gap + Gap / 2, Scale};
    double point[Dimension] = {};
    static_cast<void>(KFS_GetValueFPlus(stream.get(), &beside, 0, point, nullptr, nullptr));
    for (auto _ : state) {
        point[0] += 0.25;
        static_cast<void>(KFS_SetKey(stream.get(), keys / 2, point, 0, 0));
        double read[Dimension];
        benchmark::DoNotOptimize(KFS_GetValueFPlus(stream.get(), &beside, 0, read, nullptr, nullptr));
    }
}
void EditOurs(benchmark::State& state)
{
    EditAndRead(state, static_cast<int>(state.range(0)));
}
void EditYardstick(benchmark::State& state)
{
    EditAndRead(state, 10);
}
BENCHMARK(EditOurs)->Name("edit_path_then_read/ours")->Arg(1000)->Arg(30000);
BENCHMARK(EditYardstick)->Name("edit_path_then_read/yardstick")->Arg(1000)->Arg(30000);

// One step of a drag: a tangent set, and points read along the two arcs that it bends. A thousand paths at 60 a second
// leave 16,667 ns a step on one core; `of_a_core` is the share of it that a thousand such paths take. With one point
// read, the step is the edit and the repair; the rest of the step with a hundred is reading.
void Drag(benchmark::State& state)
{
    std::unique_ptr<KFS_Stream> const stream = MakePath(20, 5);
    int const reads = static_cast<int>(state.range(0));
    double tangent[Dimension] = {10.0, 0.0, 0.0};
    double step = 0.125;
    double point[Dimension];
    T_Time const start{0, Scale};
    Must(KFS_GetValueFPlus(stream.get(), &start, 0, point, nullptr, nullptr));  // the tangents that are left alone
    for (auto _ : state) {
        tangent[1] += step;
        if (tangent[1] < -50.0 || tangent[1] > 50.0) step = -step;
        static_cast<void>(KFS_SetKeySpaceTangents(stream.get(), 10, -1, nullptr, tangent));
        for (int i = 0; i < reads; ++i) {
            T_Time const at{9 * Gap + 1 + 2 * i, Scale};  // no key
            benchmark::DoNotOptimize(KFS_GetValueFPlus(stream.get(), &at, 0, point, nullptr, nullptr));
        }
    }
    state.counters["of_a_core"] =
        benchmark::Counter(1.0 / 60e3, benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}
BENCHMARK(Drag)->Name("drag_and_read/ours")->Arg(1)->Arg(100);

}  // namespace
