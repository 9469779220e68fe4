// Reads of plain streams through the public door, beside a bare search and a bare solve over the same segments.

#include "bench/barecurve.h"
#include "bench/common.h"
#include "curves/derivatives.h"
#include "curves/tangents.h"
#include "frame/services/memory.h"
#include "keystore/batchreads.h"
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

// One stream, the times at which it is asked, and the segments of its first component as a bare curve.
struct Fixture {
    Fixture(int keys, short dimension, char interp, unsigned int seed = 42) : count(keys)
    {
        Library();
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        stream =
            std::make_unique<KFS_Stream>(dimension, Scale, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
        std::mt19937 random(seed);
        std::uniform_real_distribution<double> value(-100.0, 100.0), influence(0.0, 1.0), speed(-300.0, 300.0);
        std::vector<double> v(static_cast<std::size_t>(dimension)), in(v), out(v), inInf(v), outInf(v);
        double const dt = static_cast<double>(Gap) / Scale;
        double before[2] = {}, influenceBefore = 0.0;  // the last key's value and handle
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
            bare.times.push_back(at.value);
            double const heights[4] = {before[0], before[1], v[0] - inInf[0] * dt * in[0], v[0]};
            if (i > 0) bare.segments.push_back(BareSegment::Make(heights, influenceBefore, inInf[0], Gap));
            before[0] = v[0], before[1] = v[0] + outInf[0] * dt * out[0];
            influenceBefore = outInf[0];
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
    BareCurve bare;
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

// `solve` takes the curve, the segment and the time.
template <class Solve>
void Bare(benchmark::State& state, Fixture const& fixture, Order order, Solve&& solve)
{
    std::vector<int> const asked = fixture.Times(order);
    std::size_t i = 0, at = 0;
    for (auto _ : state) {
        int const time = asked[i++ % Asked];
        at = order == Order::Random ? fixture.bare.Find(time) : fixture.bare.Walk(at, time);
        benchmark::DoNotOptimize(solve(fixture.bare, at, time));
    }
}

double SolveSpline(BareCurve const& curve, std::size_t at, int time)
{
    return curve.Spline(at, time);
}

template <char Interp, Order order>
void Ours(benchmark::State& state)
{
    Read(state, Get(static_cast<int>(state.range(0)), 1, Interp), order);
}
template <char Interp, Order order>
void Yardstick(benchmark::State& state)
{
    Bare(
        state, Get(static_cast<int>(state.range(0)), 1, Interp), order,
        [](BareCurve const& curve, std::size_t at, int time) {
            if constexpr (Interp == KFS_Interp_Spline) return curve.Spline(at, time);
            if constexpr (Interp == KFS_Interp_Linear) return curve.Line(at, time);
            return curve.Held(at);
        });
}
#define READS(topic, interp, order)                                                                                    \
    BENCHMARK(Ours<interp, order>)->Name(topic "/ours")->Arg(8)->Arg(1000)->Arg(30000);                                \
    BENCHMARK(Yardstick<interp, order>)->Name(topic "/yardstick")->Arg(8)->Arg(1000)->Arg(30000)
READS("read_spline_random", KFS_Interp_Spline, Order::Random);
READS("read_spline_24_a_second", KFS_Interp_Spline, Order::Frames);
READS("read_linear_random", KFS_Interp_Linear, Order::Random);
READS("read_linear_24_a_second", KFS_Interp_Linear, Order::Frames);
READS("read_hold_random", KFS_Interp_Hold, Order::Random);
READS("read_hold_24_a_second", KFS_Interp_Hold, Order::Frames);
#undef READS

// An array of times on one stream, beside the bare curve asked one by one.
template <Order order>
void TimesOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Spline);
    std::vector<T_Time> times;
    for (int const time : fixture.Times(order)) times.push_back({time, Scale});
    std::vector<double> values(times.size());
    for (auto _ : state) {
        benchmark::DoNotOptimize(KFS_ReadTimes(fixture.stream.get(), times.data(), Asked, 0, values.data(), nullptr));
        benchmark::ClobberMemory();
    }
}
template <Order order>
void TimesYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(static_cast<int>(state.range(0)), 1, KFS_Interp_Spline);
    std::vector<int> const times = fixture.Times(order);
    std::vector<double> values(times.size());
    for (auto _ : state) {
        std::size_t at = 0;
        for (std::size_t i = 0; i < times.size(); ++i) {
            at = order == Order::Random ? fixture.bare.Find(times[i]) : fixture.bare.Walk(at, times[i]);
            values[i] = fixture.bare.Spline(at, times[i]);
        }
        benchmark::ClobberMemory();
    }
}
BENCHMARK(TimesOurs<Order::Random>)->Name("array_of_times_random/ours")->Arg(1000);
BENCHMARK(TimesYardstick<Order::Random>)->Name("array_of_times_random/yardstick")->Arg(1000);
BENCHMARK(TimesOurs<Order::Frames>)->Name("array_of_times_24_a_second/ours")->Arg(1000);
BENCHMARK(TimesYardstick<Order::Frames>)->Name("array_of_times_24_a_second/yardstick")->Arg(1000);

// Equal steps, as KFS_GetValuesFPlus takes them.
void StepsOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    T_Time const start{1, Scale}, step{25, Scale};
    for (auto _ : state) {
        char** values = nullptr;
        Must(KFS_GetValuesFPlus(fixture.stream.get(), &start, &step, 3000, 0, &values));
        benchmark::ClobberMemory();
        Q_FreeHandle(values);
    }
}
void StepsYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    std::vector<double> values(3000);
    for (auto _ : state) {
        std::size_t at = 0;
        for (int i = 0; i < 3000; ++i) {
            at = fixture.bare.Walk(at, 1 + i * 25);
            values[static_cast<std::size_t>(i)] = fixture.bare.Spline(at, 1 + i * 25);
        }
        benchmark::ClobberMemory();
    }
}
BENCHMARK(StepsOurs)->Name("array_of_steps/ours");
BENCHMARK(StepsYardstick)->Name("array_of_steps/yardstick");

// A frame of an application: many streams at one time, then the next frame. The yardstick asks bare curves that lie apart
// as the streams do.
std::vector<std::unique_ptr<Fixture>> const& Panel()
{
    static std::vector<std::unique_ptr<Fixture>> const panel = [] {
        std::vector<std::unique_ptr<Fixture>> made;
        for (unsigned int i = 0; i < 10000; ++i)
            made.push_back(std::make_unique<Fixture>(10, static_cast<short>(1), char{KFS_Interp_Spline}, 100 + i));
        return made;
    }();
    return panel;
}
std::vector<KFS_Stream const*> PanelStreams()
{
    std::vector<KFS_Stream const*> streams;
    for (std::unique_ptr<Fixture> const& fixture : Panel()) streams.push_back(fixture->stream.get());
    return streams;
}
int PanelTime(int frame)
{
    return 1 + frame % 35 * 25;
}
void PanelBatch(benchmark::State& state)
{
    std::vector<KFS_Stream const*> const streams = PanelStreams();
    std::vector<double> values(streams.size());
    int frame = 0;
    for (auto _ : state) {
        T_Time const at{PanelTime(frame++), Scale};
        Must(KFS_ReadStreams(streams.data(), static_cast<int>(streams.size()), &at, 0, values.data(), 1, nullptr));
        benchmark::ClobberMemory();
    }
}
void ReadPanel(benchmark::State& state)
{
    std::vector<KFS_Stream const*> const streams = PanelStreams();
    std::vector<double> values(streams.size());
    int frame = 0;
    for (auto _ : state) {
        T_Time const at{PanelTime(frame++), Scale};
        for (std::size_t i = 0; i < streams.size(); ++i)
            benchmark::DoNotOptimize(KFS_GetValueFPlus(streams[i], &at, 0, &values[i], nullptr, nullptr));
    }
}
void PanelYardstick(benchmark::State& state)
{
    std::vector<std::unique_ptr<Fixture>> const& panel = Panel();
    std::vector<double> values(panel.size());
    int frame = 0;
    for (auto _ : state) {
        int const time = PanelTime(frame++);
        for (std::size_t i = 0; i < panel.size(); ++i)
            values[i] = panel[i]->bare.Spline(panel[i]->bare.Find(time), time);
        benchmark::ClobberMemory();
    }
}
void RenderPanel(benchmark::State& state)
{
    static boost::shared_ptr<Q_RenderContext> const render = kfshost::MakeRenderContext(true);
    Q_ScSetCurrentRenderContext const current(render);
    ReadPanel(state);
}
BENCHMARK(PanelBatch)->Name("one_time_10000_streams_batch/ours");
BENCHMARK(PanelYardstick)->Name("one_time_10000_streams_batch/yardstick");
BENCHMARK(ReadPanel)->Name("one_time_10000_streams_loop/ours");
BENCHMARK(PanelYardstick)->Name("one_time_10000_streams_loop/yardstick");
// What a render's copies cost more than the streams themselves.
BENCHMARK(RenderPanel)->Name("render_copy_among_10000/ours");
BENCHMARK(ReadPanel)->Name("render_copy_among_10000/yardstick");

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
        [](BareCurve const& curve, std::size_t at, int time) {
            double sum = 0.0;
            double const share = curve.Share(at, time);
            for (std::size_t d = 0; d < 3; ++d) {
                BareSegment const& segment = curve.segments[(at + d * 7) % curve.segments.size()];
                sum += segment.Y(segment.Parameter(share));
            }
            return sum;
        });
}
BENCHMARK(Spline3Ours)->Name("read_spline_3_components/ours")->Arg(1000);
BENCHMARK(Spline3Yardstick)->Name("read_spline_3_components/yardstick")->Arg(1000);

// The same time again: a search and a copy.
void RepeatOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    T_Time const at{fixture.bare.times[500] + 33, Scale};
    double value = 0.0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(KFS_GetValueFPlus(fixture.stream.get(), &at, 0, &value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}
void RepeatYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(1000, 1, KFS_Interp_Spline);
    int time = fixture.bare.times[500] + 33;
    for (auto _ : state) {
        benchmark::DoNotOptimize(time);
        benchmark::DoNotOptimize(fixture.bare.Find(time));
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
    Bare(state, Get(1000, 1, KFS_Interp_Spline), Order::Random, SolveSpline);
}
BENCHMARK(ExternalOurs)->Name("read_external_form/ours");
BENCHMARK(ExternalYardstick)->Name("read_external_form/yardstick");

}  // namespace
