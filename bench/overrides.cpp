// What overrides and identities add to the reads that they go with.

#include "bench/common.h"
#include "frame/frame.h"
#include "frame/services/identifiers.h"
#include "identity/renderoptions.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "overrides/parambag.h"
#include "tree/factory.h"
#include "tree/indexedgroup.h"

#include <benchmark/benchmark.h>

#include <boost/make_shared.hpp>

#include <map>
#include <memory>
#include <random>
#include <vector>

namespace {

using hearth::utility::Guid;
using IdentityHash = hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>;

constexpr unsigned int Scale = 600;
constexpr int Keys = 1000;
constexpr int Gap = 100;
constexpr int Asked = 4096;

KFS_ValueDesc Doubles()
{
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    return desc;
}

KFS_MatchName LeafName()
{
    return {"Bench Overridden Leaf", true};
}
KFS_MatchName RootName()
{
    return {"Bench Overridden Root", true};
}
KFS_MatchName TopName()
{
    return {"Bench Overridden Top", true};
}

// A leaf with a vector, as identities want one.
class Leaf final : public KFS_Stream {
public:
    Leaf(KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int scale, bool canonical)
        : KFS_Stream(1, scale, constant, false, KFS_InterpMask_All, 0, Doubles(), &name, factory, canonical)
    {}
    void FillInParamDef() const override
    {
        FillInParamDefDetails(FX_Param_FLOAT_SLIDER, -100.0, 100.0, -100.0, 100.0, 2, 0, 0, 0, 0);
    }
    M_Vector4T<double> GetVector4Ex(KFS_EvalData const& eval) const override
    {
        M_Vector4T<double> vector{};
        Must(KFS_GetValueFPlus(this, &eval.time, eval.flags, vector.v, nullptr, eval.bag));
        return vector;
    }
};

class Root final : public KFS_IndexedStreamGroup {
public:
    Root(KFS_MatchName const& name, KFS_StreamFactory* factory, bool canonical)
        : KFS_IndexedStreamGroup(&name, factory, canonical)
    {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const&) const override
    {
        return new Root(RootName(), GetFactory(), false);
    }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        layout->push_back(GetFactory()->GetCanonicalStream(LeafName()));
    }
};

// Of groups like that.
class Top final : public KFS_IndexedStreamGroup {
public:
    Top(KFS_MatchName const& name, KFS_StreamFactory* factory, bool canonical)
        : KFS_IndexedStreamGroup(&name, factory, canonical)
    {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const&) const override
    {
        return new Top(TopName(), GetFactory(), false);
    }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        layout->push_back(GetFactory()->GetCanonicalStream(RootName()));
    }
};

void Register()
{
    Library();
    KFS_StreamFactory* const factory = Get_VX_StreamFactory();
    factory->RegisterFactoryFunc(
        LeafName(),
        [](KFS_MatchName const& name, KFS_StreamFactory* of, bool constant, unsigned int scale, bool canonical) {
            return new Leaf(name, of, constant, scale, canonical);
        },
        false);
    factory->RegisterFactoryFunc(
        RootName(),
        [](KFS_MatchName const& name, KFS_StreamFactory* of, bool, unsigned int, bool canonical) {
            return new Root(name, of, canonical);
        },
        false);
    factory->RegisterFactoryFunc(
        TopName(),
        [](KFS_MatchName const& name, KFS_StreamFactory* of, bool, unsigned int, bool canonical) {
            return new Top(name, of, canonical);
        },
        false);
}

void RegisterOnce()
{
    static bool const registered = (Register(), true);
    benchmark::DoNotOptimize(registered);
}

// Streams of one tree, and a bag that names the last few of them.
struct Fixture {
    explicit Fixture(int streams, int named)
    {
        RegisterOnce();
        root = std::make_unique<Root>(RootName(), Get_VX_StreamFactory(), false);
        std::mt19937 random(42);
        std::uniform_real_distribution<double> value(-100.0, 100.0);
        for (int s = 0; s < streams; ++s) {
            Q_ScAutoPtr<KFS_StreamBase> made(new Leaf(LeafName(), Get_VX_StreamFactory(), false, Scale, false));
            leaves.push_back(static_cast<Leaf*>(made.get()));
            root->AppendStream(&made);
            for (int i = 0; i < Keys; ++i) {
                T_Time const at{i * Gap, Scale};
                double const number = value(random);
                Must(KFS_InsertKeyF(leaves.back(), &at, 1, &number, KFS_Interp_Spline, KFS_Interp_Spline));
            }
        }
        for (int n = 0; n < named; ++n) {
            Leaf const* const leaf = leaves[leaves.size() - 1 - static_cast<std::size_t>(n)];
            bag.AddOverride(leaf, boost::make_shared<KFS_StreamOverride>(
                                      leaf, KFS_OverrideValue(std::vector<double>{1.0 * n}), false));
        }
        for (int i = 0; i < Asked; ++i) times.push_back(static_cast<int>(random() % ((Keys - 1) * Gap)));
    }

    std::unique_ptr<Root> root;
    std::vector<Leaf*> leaves;
    KFS_ParamBag bag;
    std::vector<int> times;
};

Fixture const& Bagged()
{
    static Fixture const* const fixture = new Fixture(17, 16);
    return *fixture;
}

void Read(benchmark::State& state, Leaf const* leaf, KFS_ParamBag const* bag)
{
    std::vector<int> const& times = Bagged().times;
    double value = 0.0;
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{times[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(leaf, &at, 0, &value, nullptr, bag));
        benchmark::DoNotOptimize(value);
    }
}

// With a bag of sixteen overrides that doesn't name the stream, beside a read without one.
void UnnamedOurs(benchmark::State& state)
{
    Read(state, Bagged().leaves.front(), &Bagged().bag);
}
void UnnamedYardstick(benchmark::State& state)
{
    Read(state, Bagged().leaves.front(), nullptr);
}
BENCHMARK(UnnamedOurs)->Name("read_bag_of_others/ours");
BENCHMARK(UnnamedYardstick)->Name("read_bag_of_others/yardstick");

// Overridden: the keys are followed all the same, and the number is another one. Beside a read and a look-up in a map of
// as many identifiers.
void NamedOurs(benchmark::State& state)
{
    Read(state, Bagged().leaves.back(), &Bagged().bag);
}
void NamedYardstick(benchmark::State& state)
{
    std::map<u16str, double> numbers;
    Fixture const& fixture = Bagged();
    for (std::size_t n = 0; n < 16; ++n) numbers[fixture.leaves[1 + n]->GetStreamCapsuleData().id] = 1.0;
    Leaf const* const leaf = fixture.leaves.back();
    double value = 0.0;
    std::size_t i = 0;
    for (auto _ : state) {
        T_Time const at{fixture.times[i++ % Asked], Scale};
        benchmark::DoNotOptimize(KFS_GetValueFPlus(leaf, &at, 0, &value, nullptr, nullptr));
        benchmark::DoNotOptimize(value);
        benchmark::DoNotOptimize(numbers.find(leaf->GetStreamCapsuleData().id));
    }
}
BENCHMARK(NamedOurs)->Name("read_overridden/ours");
BENCHMARK(NamedYardstick)->Name("read_overridden/yardstick");

// ---- the identity of a tree over half a second, which holds three keys and their four gaps

class Frame final : public KFS_RenderOptionsBase {
public:
    T_Time const* GetTimeSpanStart() const override { return &start_; }
    void SetTimeSpanStart(T_Time const* start) override { start_ = *start; }
    T_Time const* GetTimeSpanDuration() const override { return &duration_; }
    void SetTimeSpanDuration(T_Time const* duration) override { duration_ = *duration; }
    T_Time const* GetShutterDuration() const override { return &shutter_; }
    void GetShutterSpan(int, T_Time*, T_Time*) const override {}
    KFS_ParamBag const* GetParamBag() const override { return &bag_; }

private:
    T_Time start_{50 * Gap + Gap / 2, Scale};
    T_Time duration_{3 * Gap, Scale};
    T_Time shutter_{0, 1};
    KFS_ParamBag bag_;
};

constexpr int SpanKeys = 5;
// A value, what lies on its two sides and its place.
constexpr std::size_t KeyBytes = 8 + 2 * 17 + 16;

Fixture const& Tree()
{
    static Fixture const* const fixture = new Fixture(100, 0);
    return *fixture;
}

void IdentityOurs(benchmark::State& state)
{
    Fixture const& tree = Tree();
    Frame const frame;
    for (auto _ : state) benchmark::DoNotOptimize(tree.root->GetRenderGuid(frame, nullptr));
}
// The same number of reads of keys' values and of bytes for the hash.
void IdentityYardstick(benchmark::State& state)
{
    Fixture const& tree = Tree();
    std::vector<unsigned char> const bytes(KeyBytes * SpanKeys);
    for (auto _ : state) {
        IdentityHash whole;
        for (Leaf const* const leaf : tree.leaves) {
            double value = 0.0;
            for (int key = 50; key < 50 + SpanKeys; ++key) {
                T_Time const at{key * Gap, Scale};
                benchmark::DoNotOptimize(KFS_GetValueFPlus(leaf, &at, 0, &value, nullptr, nullptr));
                benchmark::DoNotOptimize(value);
            }
            IdentityHash hash;
            hash.Mix(bytes.data(), bytes.size());
            Guid const guid = hash.GetGuid();
            whole.Mix(guid.GuidToBytes().data(), 16);
        }
        benchmark::DoNotOptimize(whole.GetGuid());
    }
}
// ---- the identity of a big tree at a moment: constants, but for one leaf in a hundred that has keys

struct BigTree {
    BigTree()
    {
        RegisterOnce();
        top = std::make_unique<Top>(TopName(), Get_VX_StreamFactory(), false);
        for (int g = 0; g < 1000; ++g) {
            Q_ScAutoPtr<KFS_StreamBase> made(new Root(RootName(), Get_VX_StreamFactory(), false));
            auto* const group = static_cast<Root*>(made.get());
            top->AppendStream(&made);
            for (int i = 0; i < 99; ++i) Append(group, i == g % 99);
        }
    }
    void Append(Root* group, bool animated)
    {
        Q_ScAutoPtr<KFS_StreamBase> made(new Leaf(LeafName(), Get_VX_StreamFactory(), !animated, Scale, false));
        auto* const leaf = static_cast<Leaf*>(made.get());
        group->AppendStream(&made);
        for (int key = 0; key < (animated ? 5 : 1); ++key) {
            T_Time const at{key * 30 * Gap, Scale};
            double const number = 7.0 * static_cast<double>(leaves.size() % 13) + key;
            Must(KFS_InsertKeyF(leaf, &at, 1, &number, KFS_Interp_Spline, KFS_Interp_Spline));
        }
        leaves.push_back(leaf);
        if (animated) edited.push_back(leaf);
    }

    std::unique_ptr<Top> top;
    std::vector<Leaf*> leaves;
    std::vector<Leaf*> edited;
};

BigTree const& Big()
{
    static BigTree const* const tree = new BigTree;
    return *tree;
}

void EditOne()
{
    static int turn = 0;
    double const number = ++turn;
    std::vector<Leaf*> const& edited = Big().edited;
    Must(KFS_SetKeyF(edited[static_cast<std::size_t>(turn) % edited.size()], 1, &number, 0, 0));
}

void BigIdentityOurs(benchmark::State& state)
{
    BigTree const& tree = Big();
    Frame const frame;
    for (auto _ : state) {
        EditOne();
        benchmark::DoNotOptimize(tree.top->GetRenderGuid(frame, nullptr));
    }
}
// The same bytes in one pass, and the reads.
void BigIdentityYardstick(benchmark::State& state)
{
    BigTree const& tree = Big();
    constexpr std::size_t NameBytes = 21;
    constexpr std::size_t KeysOfSpan = 2;
    std::vector<unsigned char> const bytes(
        tree.leaves.size() * (NameBytes + 8 + 16) + tree.edited.size() * (KeysOfSpan * KeyBytes - 8), 7);
    for (auto _ : state) {
        EditOne();
        double value = 0.0;
        for (Leaf const* const leaf : tree.leaves) {
            T_Time const at{50 * Gap + Gap / 2, Scale};
            benchmark::DoNotOptimize(KFS_GetValueFPlus(leaf, &at, 0, &value, nullptr, nullptr));
            benchmark::DoNotOptimize(value);
        }
        for (Leaf const* const leaf : tree.edited) {
            T_Time const at{30 * Gap, Scale};
            benchmark::DoNotOptimize(KFS_GetValueFPlus(leaf, &at, 0, &value, nullptr, nullptr));
            benchmark::DoNotOptimize(value);
        }
        IdentityHash hash;
        hash.Mix(bytes.data(), bytes.size());
        benchmark::DoNotOptimize(hash.GetGuid());
    }
}
BENCHMARK(BigIdentityOurs)->Name("identity_of_100000_nodes/ours");
BENCHMARK(BigIdentityYardstick)->Name("identity_of_100000_nodes/yardstick");

BENCHMARK(IdentityOurs)->Name("identity_of_100_leaves/ours");
BENCHMARK(IdentityYardstick)->Name("identity_of_100_leaves/yardstick");

}  // namespace
