// Typed and separated reads, beside the reads that they consist of.

#include "bench/common.h"
#include "frame/frame.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/separation.h"
#include "tree/factory.h"
#include "tree/namedgroup.h"

#include <benchmark/benchmark.h>

#include <memory>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

namespace {

constexpr unsigned int Scale = 600;
constexpr int Gap = 100;
constexpr int Keys = 1000;
constexpr std::size_t Asked = 4096;

void Check(int code)
{
    if (code != 0) throw std::runtime_error("a benchmark's stream can't be made");
}

void FillWithSplines(KFS_Stream* stream, unsigned int seed)
{
    std::mt19937 random(seed);
    std::uniform_real_distribution<double> value(-100.0, 100.0);
    for (int i = 0; i < Keys; ++i) {
        T_Time const at{i * Gap, Scale};
        double const v = value(random);
        Check(KFS_InsertKeyF(stream, &at, 1, &v, KFS_Interp_Spline, KFS_Interp_Spline));
    }
}

std::vector<int> Times()
{
    std::mt19937 random(7);
    std::vector<int> asked(Asked);
    for (int& time : asked) time = static_cast<int>(random() % ((Keys - 1) * Gap));
    return asked;
}

// ---- a typed stream

struct OpacityTraits {
    using ValueType = double;
};

class Opacity final : public KFS_FloatStream<OpacityTraits> {
public:
    Opacity() : KFS_FloatStream(1, Scale, 0, 0, KFS_InterpMask_All, 0, Desc(), nullptr, nullptr, false) {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const&) const override { return nullptr; }

private:
    static KFS_ValueDesc Desc()
    {
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        return desc;
    }
};

KFS_DerivedStream<OpacityTraits> const& TypedStream()
{
    static KFS_DerivedStream<OpacityTraits> const* const stream = [] {
        Library();
        auto* const made = new Opacity;
        FillWithSplines(made, 42);
        return made;
    }();
    return *stream;
}

void TypedOurs(benchmark::State& state)
{
    KFS_DerivedStream<OpacityTraits> const& stream = TypedStream();
    std::vector<int> const asked = Times();
    std::size_t i = 0;
    for (auto _ : state) {
        KFS_EvalData const eval{{asked[i++ % Asked], Scale}, 0, nullptr};
        benchmark::DoNotOptimize(stream.GetValueEx(eval));
    }
}
void TypedYardstick(benchmark::State& state)
{
    KFS_Stream const& stream = TypedStream();
    std::vector<int> const asked = Times();
    double value = 0.0;
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(&stream, &at, 0, &value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}
BENCHMARK(TypedOurs)->Name("read_typed/ours");
BENCHMARK(TypedYardstick)->Name("read_typed/yardstick");

// ---- a separated position among other properties

constexpr int Others = 6;

KFS_MatchName NameOf(char const* text)
{
    return {text, true};
}

class Position final : public KFS_Stream {
public:
    Position(KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int scale, bool canonical,
             short dimension)
        : KFS_Stream(dimension, scale, constant, 0, KFS_InterpMask_All, 0, {.dataType = KFS_Type_Double}, &name,
                     factory, canonical)
    {}
    bool IsSeparationLeader() const override { return GetDimension() == 3; }
};

std::vector<KFS_MatchName> const& Kinds()
{
    static std::vector<KFS_MatchName> const kinds = [] {
        std::vector<KFS_MatchName> made{NameOf("Bench Position")};
        for (int i = 0; i < Others; ++i) made.push_back(NameOf(("Bench Other " + std::to_string(i)).c_str()));
        return made;
    }();
    return kinds;
}

class Transform final : public KFS_NamedStreamGroup {
public:
    Transform(KFS_MatchName const& name, KFS_StreamFactory* factory, bool canonical)
        : KFS_NamedStreamGroup(&name, factory, canonical)
    {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const&) const override { return nullptr; }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        for (KFS_MatchName const& kind : Kinds()) layout->push_back(GetFactory()->GetCanonicalStream(kind));
    }
};

// Never ended, as the library.
KFS_Stream const& Separated()
{
    static KFS_Stream const* const leader = [] {
        Library();
        KFS_StreamFactory* const factory = Get_VX_StreamFactory();
        for (KFS_MatchName const& kind : Kinds())
            factory->RegisterFactoryFunc(
                kind,
                [](KFS_MatchName const& name, KFS_StreamFactory* of, bool constant, unsigned int scale,
                   bool canonical) {
                    return new Position(name, of, constant, scale, canonical, name == Kinds().front() ? 3 : 1);
                },
                false);
        KFS_MatchName const name = NameOf("Bench Transform");
        factory->RegisterFactoryFunc(
            name,
            [](KFS_MatchName const& kind, KFS_StreamFactory* of, bool, unsigned int, bool canonical) {
                return new Transform(kind, of, canonical);
            },
            false);
        auto* const group = new Transform(name, factory, false);
        KFS_Stream* const made = group->GetEditableLeafStream(Kinds().front());
        for (int d = 0; d < 3; ++d) {
            KFS_Stream* const follower = made->GetSeparationFollower(d);
            Check(follower->SetConstant(false, false));
            FillWithSplines(follower, 42 + static_cast<unsigned int>(d));
        }
        made->SetDimensionsSeparated(true);
        return made;
    }();
    return *leader;
}

void SeparatedOurs(benchmark::State& state)
{
    KFS_Stream const& leader = Separated();
    std::vector<int> const asked = Times();
    double value[3] = {};
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(&leader, &at, 0, value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}
void SeparatedYardstick(benchmark::State& state)
{
    std::vector<KFS_Stream const*> followers;
    Separated().GetSeparationFollowers(followers);
    std::vector<int> const asked = Times();
    double value[3] = {};
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{asked[i++ % Asked], Scale};
        for (std::size_t d = 0; d < 3; ++d)
            benchmark::DoNotOptimize(KFS_GetValueFPlus(followers[d], &at, 0, value + d, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
    }
}
BENCHMARK(SeparatedOurs)->Name("read_separated/ours");
BENCHMARK(SeparatedYardstick)->Name("read_separated/yardstick");

}  // namespace
