// Reads of plain streams through the public door, beside a bare search and a bare solve over the same segments.

#include "bench/common.h"
#include "curves/derivatives.h"
#include "curves/tangents.h"
#include "frame/services/curvekernel.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <cstdint>
#include <map>
#include <memory>
#include <random>
#include <vector>

namespace {

constexpr unsigned int Scale = 600;
constexpr int Gap = 100;
constexpr int Asked = 4096;

enum class Order { Random, Frames };

// One stream, the times at which it is asked, and its segments as bare curves in one array.
struct Fixture {
    struct Segment {
        double p0[2], p1[2], p2[2], p3[2];
    };

    Fixture(int keys, short dimension, char interp) : count(keys)
    {
        Library();
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        stream =
            std::make_unique<KFS_Stream>(dimension, Scale, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
        std::mt19937 random(42);
        std::uniform_real_distribution<double> value(-100.0, 100.0), influence(0.0, 1.0), speed(-300.0, 300.0);
        std::vector<double> v(static_cast<std::size_t>(dimension)), in(v), out(v), inInf(v), outInf(v);
        std::vector<std::vector<double>> values, outSpeeds, inSpeeds, outInfluences, inInfluences;
        for (int i = 0; i < keys; ++i) {
            T_Time const at{i * Gap, Scale};
            for (short d = 0; d < dimension; ++d) {
                auto const c = static_cast<std::size_t>(d);
                v[c] = value(random), in[c] = speed(random), out[c] = speed(random);
                inInf[c] = influence(random), outInf[c] = influence(random);
            }
            Must(KFS_InsertKeyF(stream.get(), &at, 1, v.data(), interp, interp));
            Must(KFS_SetKeyVelocityF(stream.get(), i, in.data(), out.data()));
            Must(KFS_SetKeyInfluence(stream.get(), i, inInf.data(), outInf.data()));
            values.push_back(v), outSpeeds.push_back(out), inSpeeds.push_back(in);
            outInfluences.push_back(outInf), inInfluences.push_back(inInf);
            times.push_back(at.value);
        }
        double const dt = static_cast<double>(Gap) / Scale;
        for (std::size_t i = 0; i + 1 < static_cast<std::size_t>(keys); ++i) {
            double const g = outInfluences[i][0] * dt;
            double const h = -inInfluences[i + 1][0] * dt;
            segments.push_back({{0.0, values[i][0]},
                                {g, values[i][0] + g * outSpeeds[i][0]},
                                {dt + h, values[i + 1][0] + h * inSpeeds[i + 1][0]},
                                {dt, values[i + 1][0]}});
        }
    }

    std::vector<int> Times(Order order) const
    {
        std::mt19937 random(7);
        std::vector<int> asked;
        int const span = (count - 1) * Gap;
        for (int i = 0; i < Asked; ++i) {
            int const time =
                order == Order::Random ? static_cast<int>(random() % static_cast<unsigned>(span)) : i * 25 % span;
            asked.push_back(time % Gap == 0 ? time + 1 : time);
        }
        return asked;
    }

    int count;
    std::unique_ptr<KFS_Stream> stream;
    std::vector<int> times;
    std::vector<Segment> segments;
};

Fixture const& Get(int keys, short dimension, char interp)
{
    static std::map<std::tuple<int, short, char>, std::unique_ptr<Fixture>> made;
    std::unique_ptr<Fixture>& fixture = made[{keys, dimension, interp}];
    if (!fixture) fixture = std::make_unique<Fixture>(keys, dimension, interp);
    return *fixture;
}

void Read(benchmark::State& state, Fixture const& fixture, Order order)
{
    std::vector<int> const asked = fixture.Times(order);
    double value[4] = {};
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(fixture.stream.get(), &at, 0, value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}

// How fast it changes there, beside its value.
void ReadRate(benchmark::State& state, Fixture const& fixture, Order order)
{
    std::vector<int> const asked = fixture.Times(order);
    double rate[4] = {};
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(
            KFS_GetDeriv(fixture.stream.get(), &at, KFS_Deriv_Velocity, 0, 0, rate, nullptr, nullptr, {}, {}));
        benchmark::DoNotOptimize(rate);
    }
}

template <class Solve>
void Bare(benchmark::State& state, Fixture const& fixture, Order order, Solve&& solve)
{
    std::vector<int> const asked = fixture.Times(order);
    std::size_t i = 0;
    for (auto _ : state) {
        int const time = asked[i++ % Asked];
        int const next = Search(fixture.times, time);
        double value = 0.0;
        solve(fixture, next - 1, static_cast<double>(time - fixture.times[static_cast<std::size_t>(next - 1)]) / Scale,
              &value);
        benchmark::DoNotOptimize(value);
    }
}

void SolveCurve(Fixture const& fixture, int segment, double x, double* y)
{
    Fixture::Segment& s = const_cast<Fixture::Segment&>(fixture.segments[static_cast<std::size_t>(segment)]);
    CRV_Curve const curve{2, s.p0, s.p1, s.p2, s.p3};
    static_cast<void>(CRV_EvaluateYFromX(&curve, y, x));
}

void SolveLine(Fixture const& fixture, int segment, double x, double* y)
{
    Fixture::Segment const& s = fixture.segments[static_cast<std::size_t>(segment)];
    *y = s.p0[1] + (s.p3[1] - s.p0[1]) * (x / s.p3[0]);
}

void SplineOurs(benchmark::State& state)
{
    Read(state, Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Spline), Order::Random);
}
void SplineYardstick(benchmark::State& state)
{
    Bare(state, Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Spline), Order::Random, SolveCurve);
}
BENCHMARK(SplineOurs)->Name("read_spline_random/ours")->Arg(8)->Arg(1000)->Arg(30000);
BENCHMARK(SplineYardstick)->Name("read_spline_random/yardstick")->Arg(8)->Arg(1000)->Arg(30000);

void FramesOurs(benchmark::State& state)
{
    Read(state, Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Spline), Order::Frames);
}
void FramesYardstick(benchmark::State& state)
{
    Bare(state, Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Spline), Order::Frames, SolveCurve);
}
BENCHMARK(FramesOurs)->Name("read_spline_24_a_second/ours")->Arg(8)->Arg(1000)->Arg(30000);
BENCHMARK(FramesYardstick)->Name("read_spline_24_a_second/yardstick")->Arg(8)->Arg(1000)->Arg(30000);

void LinearOurs(benchmark::State& state)
{
    Read(state, Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Linear), Order::Random);
}
void LinearYardstick(benchmark::State& state)
{
    Bare(state, Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Linear), Order::Random, SolveLine);
}
BENCHMARK(LinearOurs)->Name("read_linear_random/ours")->Arg(8)->Arg(1000)->Arg(30000);
BENCHMARK(LinearYardstick)->Name("read_linear_random/yardstick")->Arg(8)->Arg(1000)->Arg(30000);

template <char Interp, Order order>
void RateOurs(benchmark::State& state)
{
    ReadRate(state, Get(1000, 1, Interp), order);
}
template <char Interp, Order order>
void RateYardstick(benchmark::State& state)
{
    Read(state, Get(1000, 1, Interp), order);
}
BENCHMARK(RateOurs<KFS_Interp_Spline, Order::Random>)->Name("rate_spline_random/ours");
BENCHMARK(RateYardstick<KFS_Interp_Spline, Order::Random>)->Name("rate_spline_random/yardstick");
BENCHMARK(RateOurs<KFS_Interp_Spline, Order::Frames>)->Name("rate_spline_24_a_second/ours");
BENCHMARK(RateYardstick<KFS_Interp_Spline, Order::Frames>)->Name("rate_spline_24_a_second/yardstick");
BENCHMARK(RateOurs<KFS_Interp_Linear, Order::Random>)->Name("rate_linear_random/ours");
BENCHMARK(RateYardstick<KFS_Interp_Linear, Order::Random>)->Name("rate_linear_random/yardstick");

void Spline3Ours(benchmark::State& state)
{
    Read(state, Get(static_cast<int>(state.range(0)), 3, KFS_Interp_Spline), Order::Random);
}
void Spline3Yardstick(benchmark::State& state)
{
    Bare(
        state, Get(static_cast<int>(state.range(0)), 3, KFS_Interp_Spline), Order::Random,
        [](Fixture const& fixture, int segment, double x, double* y) {
            for (int d = 0; d < 3; ++d) SolveCurve(fixture, (segment + d * 7) % (fixture.count - 1), x, y);
        });
}
BENCHMARK(Spline3Ours)->Name("read_spline_3_components/ours")->Arg(1000);
BENCHMARK(Spline3Yardstick)->Name("read_spline_3_components/yardstick")->Arg(1000);

// The same time again: a search and a copy.
void RepeatOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    T_Time const at{fixture.times[500] + 33, Scale};
    double value = 0.0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(KFS_GetValueFPlus(fixture.stream.get(), &at, 0, &value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}
void RepeatYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    int time = fixture.times[500] + 33;
    for (auto _ : state) {
        benchmark::DoNotOptimize(time);
        benchmark::DoNotOptimize(Search(fixture.times, time));
    }
}
BENCHMARK(RepeatOurs)->Name("read_one_time_again/ours");
BENCHMARK(RepeatYardstick)->Name("read_one_time_again/yardstick");

// A constant, beside the load of a double through a pointer that can't be foreseen.
void ConstantOurs(benchmark::State& state)
{
    Library();
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    KFS_Stream stream(1, Scale, 1, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
    T_Time const zero{0, Scale};
    double value = 3.0;
    Must(KFS_InsertKeyF(&stream, &zero, 1, &value, 0, 0));
    int time = 0;
    for (auto _ : state) {
        T_Time const at{++time, Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(&stream, &at, 0, &value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}
void ConstantYardstick(benchmark::State& state)
{
    double held = 3.0;
    double* pointer = &held;
    for (auto _ : state) {
        benchmark::DoNotOptimize(pointer);
        double value = *pointer;
        benchmark::DoNotOptimize(value);
    }
}
BENCHMARK(ConstantOurs)->Name("read_constant/ours");
BENCHMARK(ConstantYardstick)->Name("read_constant/yardstick");

// The form that converts to the data type.
void ExternalOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    std::vector<int> const asked = fixture.Times(Order::Random);
    double value = 0.0;
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValuePlus(fixture.stream.get(), &at, 0, &value, nullptr, nullptr, nullptr, 0));
        benchmark::DoNotOptimize(value);
    }
}
void ExternalYardstick(benchmark::State& state)
{
    Bare(state, Get(1000, 1, KFS_Interp_Spline), Order::Random, SolveCurve);
}
BENCHMARK(ExternalOurs)->Name("read_external_form/ours");
BENCHMARK(ExternalYardstick)->Name("read_external_form/yardstick");

}  // namespace
