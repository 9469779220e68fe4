// Keys on their way into a file in memory and back, beside one copy of the same bytes that turns each number over.

#include "bench/common.h"
#include "frame/services/chunkfile.h"
#include "keystore/edit.h"
#include "keystore/stream.h"

#include <benchmark/benchmark.h>

#include <cstdint>
#include <cstring>
#include <memory>
#include <span>
#include <vector>

namespace {

constexpr unsigned int Scale = 600;

std::unique_ptr<KFS_Stream> Empty()
{
    Library();
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    return std::make_unique<KFS_Stream>(1, Scale, 0, 0, KFS_InterpMask_All, 0, desc, nullptr, nullptr, false);
}

std::unique_ptr<KFS_Stream> MakeStream(benchmark::State const& state)
{
    std::unique_ptr<KFS_Stream> stream = Empty();
    auto const count = static_cast<std::size_t>(state.range(0));
    std::vector<int> times(count);
    std::vector<double> values(count);
    for (std::size_t i = 0; i < count; ++i) {
        times[i] = static_cast<int>(i) * 10;
        values[i] = static_cast<double>(i) * 0.25;
    }
    std::vector<char> const codes(count, KFS_Interp_Spline);
    KFS_NewKeys const keys{static_cast<int>(count), times.data(), Scale, values.data(), codes.data(), codes.data()};
    Must(KFS_InsertKeys(stream.get(), &keys, 0));
    return stream;
}

void Write(KFS_Stream const& stream, CKF_File& file)
{
    Must(file.CreateInMemory());
    stream.Write(&file);
    Must(file.Commit());
}

std::vector<unsigned char> BytesOf(benchmark::State const& state)
{
    CKF_File file;
    Write(*MakeStream(state), file);
    return {file.GetBytes().begin(), file.GetBytes().end()};
}

void WriteOurs(benchmark::State& state)
{
    std::unique_ptr<KFS_Stream> const stream = MakeStream(state);
    for (auto _ : state) {
        CKF_File file;
        Write(*stream, file);
        benchmark::DoNotOptimize(file.GetBytes().data());
    }
}

void LoadOurs(benchmark::State& state)
{
    std::vector<unsigned char> const bytes = BytesOf(state);
    for (auto _ : state) {
        CKF_File file;
        Must(file.Open(std::span(bytes)));
        std::unique_ptr<KFS_Stream> const stream = Empty();
        stream->Read(&file, nullptr);
        benchmark::DoNotOptimize(stream.get());
    }
}

// Into memory that it asks for, as both of ours do.
void TurnYardstick(benchmark::State& state)
{
    std::vector<unsigned char> const bytes = BytesOf(state);
    for (auto _ : state) {
        std::unique_ptr<unsigned char[]> const turned(new unsigned char[bytes.size()]);
        for (std::size_t i = 0; i + 8 <= bytes.size(); i += 8) {
            std::uint64_t number;
            std::memcpy(&number, &bytes[i], sizeof number);
            number = __builtin_bswap64(number);
            std::memcpy(&turned[i], &number, sizeof number);
        }
        benchmark::DoNotOptimize(turned.get());
    }
}

BENCHMARK(WriteOurs)->Name("keys_write/ours")->Arg(1000)->Arg(1000000);
BENCHMARK(TurnYardstick)->Name("keys_write/yardstick")->Arg(1000)->Arg(1000000);
BENCHMARK(LoadOurs)->Name("keys_load/ours")->Arg(1000)->Arg(1000000);
BENCHMARK(TurnYardstick)->Name("keys_load/yardstick")->Arg(1000)->Arg(1000000);

}  // namespace
