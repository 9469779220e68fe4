// Inserting keys, and the read that repairs what one edit left stale.

#include "keystore/edit.h"
#include "bench/common.h"
#include "frame/services/memory.h"
#include "keystore/evaluate.h"

#include <benchmark/benchmark.h>

#include <algorithm>
#include <memory>
#include <random>
#include <vector>

namespace {

constexpr unsigned int Scale = 600;

struct Record {
    int time;
    double numbers[5];  // 48 bytes in all: the size of a one-dimensional key
};

std::vector<int> TimesInOrder(int count)
{
    std::vector<int> times(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i) times[static_cast<std::size_t>(i)] = i * 10;
    return times;
}

std::vector<int> TimesAtRandom(int count)
{
    std::vector<int> times = TimesInOrder(count);
    std::shuffle(times.begin(), times.end(), std::mt19937(5));
    return times;
}

std::unique_ptr<KFS_Stream> MakeStream(std::vector<int> const& times, char interp)
{
    Library();
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    auto stream = std::make_unique<KFS_Stream>(1, Scale, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
    for (int const time : times) {
        T_Time const at{time, Scale};
        double const value = time * 0.25;
        Must(KFS_InsertKey(stream.get(), &at, 1, &value, interp, interp));
    }
    return stream;
}

std::vector<int> TimesFor(benchmark::State const& state)
{
    return state.range(1) ? TimesAtRandom(static_cast<int>(state.range(0)))
                          : TimesInOrder(static_cast<int>(state.range(0)));
}

// Per key: the whole time over the number of keys stands in `ns_a_key`.
void PerKey(benchmark::State& state)
{
    state.counters["ns_a_key"] =
        benchmark::Counter(static_cast<double>(state.range(0)) * 1e-9,
                           benchmark::Counter::kIsIterationInvariantRate | benchmark::Counter::kInvert);
}

void InsertOurs(benchmark::State& state)
{
    std::vector<int> const times = TimesFor(state);
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    std::unique_ptr<KFS_Stream> stream;
    for (auto _ : state) {
        stream.reset();
        stream = MakeStream(times, KFS_Interp_Linear);
    }
    state.counters["bytes_a_key"] =
        static_cast<double>(Q_MemoryLive(nullptr).bytes - before.bytes) / static_cast<double>(state.range(0));
    state.counters["record_bytes"] = sizeof(Record);
    PerKey(state);
}

// A sorted vector of records of the same size, one by one.
void InsertYardstick(benchmark::State& state)
{
    std::vector<int> const times = TimesFor(state);
    for (auto _ : state) {
        std::vector<Record> records;
        for (int const time : times) {
            auto const place = std::lower_bound(records.begin(), records.end(), time,
                                                [](Record const& record, int t) { return record.time < t; });
            records.insert(place, Record{time, {time * 0.25}});
        }
        benchmark::DoNotOptimize(records.data());
    }
    PerKey(state);
}
BENCHMARK(InsertOurs)
    ->Name("insert_keys/ours")
    ->ArgNames({"keys", "random"})
    ->ArgsProduct({{1000, 10000, 30000}, {0, 1}});
BENCHMARK(InsertYardstick)
    ->Name("insert_keys/yardstick")
    ->ArgNames({"keys", "random"})
    ->ArgsProduct({{1000, 10000, 30000}, {0, 1}});

// All keys at once, handles included, into a new stream, and the same arrays into records side by side.
struct Arrays {
    explicit Arrays(int count)
        : times(TimesInOrder(count)),
          values(times.begin(), times.end()),
          thirds(times.size(), 1.0 / 3.0),
          codes(times.size(), KFS_Interp_Spline)
    {}
    std::vector<int> times;
    std::vector<double> values, thirds;
    std::vector<char> codes;
};

void BulkOurs(benchmark::State& state)
{
    Arrays const a(static_cast<int>(state.range(0)));
    for (auto _ : state) {
        std::unique_ptr<KFS_Stream> const stream = MakeStream({}, KFS_Interp_Spline);
        KFS_NewKeys const keys{static_cast<int>(a.times.size()),
                               a.times.data(),
                               Scale,
                               a.values.data(),
                               a.codes.data(),
                               a.codes.data(),
                               a.values.data(),
                               a.thirds.data(),
                               a.values.data(),
                               a.thirds.data()};
        Must(KFS_InsertKeys(stream.get(), &keys, 0));
    }
    PerKey(state);
}

void BulkYardstick(benchmark::State& state)
{
    Arrays const a(static_cast<int>(state.range(0)));
    for (auto _ : state) {
        std::vector<int> times;
        std::vector<Record> records;
        times.reserve(a.times.size());
        records.reserve(a.times.size());
        for (std::size_t i = 0; i < a.times.size(); ++i) {
            times.push_back(a.times[i]);
            records.push_back({a.times[i], {a.values[i], a.values[i], a.thirds[i], a.values[i], a.thirds[i]}});
        }
        benchmark::DoNotOptimize(times.data());
        benchmark::DoNotOptimize(records.data());
    }
    PerKey(state);
}
BENCHMARK(BulkOurs)->Name("insert_many/ours")->Arg(1000)->Arg(100000);
BENCHMARK(BulkYardstick)->Name("insert_many/yardstick")->Arg(1000)->Arg(100000);

// A key put behind all others and taken away again.
void AppendAndRemoveOurs(benchmark::State& state)
{
    std::unique_ptr<KFS_Stream> const stream = MakeStream(TimesInOrder(1000), KFS_Interp_Linear);
    T_Time const at{10000, Scale};
    double const value = 1.0;
    for (auto _ : state) {
        benchmark::DoNotOptimize(KFS_InsertKey(stream.get(), &at, 0, &value, KFS_Interp_Linear, KFS_Interp_Linear));
        benchmark::DoNotOptimize(KFS_RemoveKey(stream.get(), 1000, nullptr));
    }
}
void AppendAndRemoveYardstick(benchmark::State& state)
{
    std::vector<int> times = TimesInOrder(1000);
    std::vector<Record> records(times.size());
    for (auto _ : state) {
        times.push_back(10000);
        records.push_back({10000, {1.0}});
        benchmark::DoNotOptimize(records.data());
        benchmark::ClobberMemory();
        times.pop_back();
        records.pop_back();
    }
}
BENCHMARK(AppendAndRemoveOurs)->Name("append_then_remove/ours");
BENCHMARK(AppendAndRemoveYardstick)->Name("append_then_remove/yardstick");

// One edit in the middle and the read beside it, which repairs the neighbourhood. The yardstick is the same on a stream
// of ten keys: the cost must not grow with the number of keys.
void EditAndRead(benchmark::State& state, int keys)
{
    std::unique_ptr<KFS_Stream> const stream = MakeStream(TimesInOrder(keys), KFS_Interp_Spline);
    int const middle = keys / 2;
    double value = 0.0;
    T_Time const beside{middle * 10 + 3, Scale};
    Must(KFS_GetValueFPlus(stream.get(), &beside, 0, &value, nullptr, nullptr));
    for (auto _ : state) {
        value += 1.0;
        static_cast<void>(KFS_SetKey(stream.get(), middle, &value, 0, 0));
        double read = 0.0;
        benchmark::DoNotOptimize(KFS_GetValueFPlus(stream.get(), &beside, 0, &read, nullptr, nullptr));
    }
}
void EditAndReadOurs(benchmark::State& state)
{
    EditAndRead(state, static_cast<int>(state.range(0)));
}
void EditAndReadYardstick(benchmark::State& state)
{
    EditAndRead(state, 10);
}
BENCHMARK(EditAndReadOurs)->Name("edit_then_read/ours")->Arg(1000)->Arg(10000)->Arg(30000);
BENCHMARK(EditAndReadYardstick)->Name("edit_then_read/yardstick")->Arg(1000)->Arg(10000)->Arg(30000);

}  // namespace
