#include "curves/floatkeys.h"
#include "curves/spacetangents.h"
#include "curves/spatial.h"
#include "curves/tangents.h"
#include "curves/update.h"
#include "identity/renderoptions.h"
#include "keystore/attributes.h"
#include "keystore/cachestate.h"
#include "keystore/copykeys.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"
#include "overrides/parambag.h"
#include "overrides/streamexpression.h"
#include "tests/support/groups.h"
#include "tests/support/streams.h"
#include "tests/support/text.h"

#include <boost/make_shared.hpp>

#include <algorithm>
#include <array>
#include <atomic>
#include <cmath>
#include <random>
#include <thread>
#include <utility>
#include <vector>

namespace {

constexpr int Renders = 8;
constexpr int Keys = 40;
constexpr int Span = Keys * 60;

class RenderThreads : public StreamTest {
protected:
    RenderThreads()
    {
        std::mt19937 random(3);
        std::uniform_real_distribution<double> value(-100.0, 100.0);
        for (int i = 0; i < Keys; ++i) {
            plain.Key(i * 60, {value(random), value(random)}, i % 3 ? KFS_Interp_Spline : KFS_Interp_Linear);
            spatial.Key(i * 60, {value(random), value(random), value(random)}, KFS_Interp_Spline);
            words.Key(i * 60, {value(random)}, KFS_Interp_Spline);
            EXPECT_EQ(0, i % 4 == 2 ? KFS_SetKeyModifiable(plain, 1, i) : 0);
        }
        constant.Key(0, {1.0, 2.0, 3.0});
        for (KFS_Stream* const stream : All()) EXPECT_EQ(0, KFS_CopyKeys(stream, nullptr, Donor(stream)));
    }

    // What a render asks: values in both forms, where keys stand, and what they are.
    std::vector<double> Sample() const
    {
        std::vector<double> samples;
        for (int time = -30; time < Span + 30; time += 7) {
            T_Time const at{time, 600};
            for (KFS_Stream const* const stream : All()) {
                double value[3] = {};
                float element[1] = {};
                int index = 0;
                bool const asDoubles = stream != words.get() || time % 2 == 0;
                int const code = asDoubles ? KFS_GetValueFPlus(stream, &at, 0, value, nullptr, nullptr)
                                           : KFS_GetValuePlus(stream, &at, 0, element, nullptr, nullptr, nullptr, 0);
                EXPECT_EQ(0, code);
                EXPECT_EQ(0, KFS_FindNearestKeyTime(stream, &at, &index, nullptr));
                if (!asDoubles) value[0] = element[0];
                samples.insert(samples.end(), std::begin(value), std::end(value));
                samples.push_back(index);
            }
        }
        for (KFS_Stream const* const stream : All())
            for (int index = 0; index < stream->GetKeyCount(); ++index) SampleKey(stream, index, samples);
        return samples;
    }

    // All that can be asked about a key and the segment that it begins.
    void SampleKey(KFS_Stream const* stream, int index, std::vector<double>& samples) const
    {
        double n[30] = {};
        EXPECT_EQ(0, KFS_GetKeyTangentsF(stream, index, n, n + 3, n + 6, n + 9));
        EXPECT_EQ(0, KFS_GetKeyInfluence(stream, index, n + 12, n + 15));
        std::fill_n(n + 18, 6, 50.0);
        unsigned char clamped = 0;
        EXPECT_EQ(0, KFS_GetClampedVelInflF(stream, index, 0, n + 18, nullptr, n + 21, nullptr, &clamped));
        // Keys may share a place or stand too near to each other for a speed.
        int codes = 10 * KFS_GetKeyVelocityF(stream, index, 0, n + 24, n + 27) + clamped;
        samples.insert(samples.end(), std::begin(n), std::end(n));
        unsigned int flags = 0;
        EXPECT_EQ(0, KFS_GetKeySpFlags(stream, index, &flags));
        T_Time time{index * 60, 600}, from{}, to{};
        EXPECT_EQ(0, KFS_PredictInvalid(stream, 1, &time, &from, &to));
        samples.insert(samples.end(), {1.0 * flags, 1.0 * from.value, 1.0 * to.value});
        if (index + 1 < stream->GetKeyCount()) {
            T_Time times[2] = {};
            int count = 0;
            codes += KFS_GetZeroVelocityPoints(stream, index, 0, &count, times, nullptr);
            samples.insert(samples.end(), {1.0 * count, 1.0 * times[0].value, 1.0 * times[1].value});
        }
        T_Time const beside{index * 60 + 20, 600};
        samples.insert(samples.end(), {1.0 * codes, 1.0 * stream->SameValueAtTimes(time, beside, nullptr),
                                       1.0 * stream->IsAnimated(true), 1.0 * stream->IsAnimated(false)});
        // The others have no path. What a stream is made of is the main thread's to look at.
        if (stream != spatial.get()) return;
        double tangents[6] = {};
        EXPECT_EQ(0, KFS_GetKeySpaceTangentsF(stream, index, -1, tangents, tangents + 3));
        samples.insert(samples.end(), std::begin(tangents), std::end(tangents));
        KFS_KeyScalar *first = nullptr, *second = nullptr;
        double t = 0.0;
        if (index + 1 == stream->GetKeyCount()) return;
        EXPECT_EQ(0, KFS_CalculateTFromStream(stream, 0, index * 60 + 20, index, &first, &second, &t));
        samples.insert(samples.end(), {1.0 * first->time, 1.0 * second->time, std::isfinite(t) ? t : -1.0});
    }

    // One of each kind of edit on each stream, in a drawn order.
    void Edit(std::mt19937& random)
    {
        std::vector<KindOfEdit> kinds = Kinds;
        std::shuffle(kinds.begin(), kinds.end(), random);
        for (KindOfEdit const& kind : kinds) {
            for (KFS_Stream* const stream : All()) {
                Draw const draw{stream,
                                *Donor(stream),
                                *constant,
                                {static_cast<int>(random() % Span), 600},
                                static_cast<int>(random() % static_cast<unsigned>(stream->GetKeyCount() - 2)) + 1};
                ASSERT_EQ(0, kind.edit(draw)) << kind.what;
                double read[3];
                EXPECT_EQ(0, KFS_GetValueFPlus(stream, &draw.at, 0, read, nullptr, nullptr)) << "after " << kind.what;
            }
        }
    }

    struct Draw {
        KFS_Stream* stream;
        KFS_Stream& donor;     // of the same kind
        KFS_Stream& constant;  // one value
        T_Time at;
        int index;  // of a key that isn't at an end
    };
    struct KindOfEdit {
        char const* what;
        int (*edit)(Draw const& draw);
    };
    static constexpr double Numbers[3] = {17.0, -3.0, 0.25};
    static std::vector<KindOfEdit> const Kinds;

    std::array<KFS_Stream*, 3> All() const { return {plain.get(), spatial.get(), words.get()}; }
    TestStream const& Donor(KFS_Stream const* stream) const
    {
        return stream == plain.get() ? plainDonor : stream == spatial.get() ? spatialDonor : wordsDonor;
    }

    TestStream plain{{.dimension = 2}}, plainDonor{{.dimension = 2}};
    TestStream spatial{{.dimension = 3, .spatial = true}}, spatialDonor{{.dimension = 3, .spatial = true}};
    TestStream words{{.type = KFS_Type_Float}}, wordsDonor{{.type = KFS_Type_Float}};
    TestStream constant{{.dimension = 3, .noKeys = true}};
};

// The first code that isn't 0. In a list the calls happen in their order.
int FirstOf(std::initializer_list<int> codes)
{
    auto const failed = std::find_if(codes.begin(), codes.end(), [](int code) { return code != 0; });
    return failed == codes.end() ? 0 : *failed;
}

std::vector<RenderThreads::KindOfEdit> const RenderThreads::Kinds = {
    {"insert",
     [](Draw const& d) { return KFS_InsertKeyF(d.stream, &d.at, 1, Numbers, KFS_Interp_Spline, KFS_Interp_Linear); }},
    {"insert on the curve", [](Draw const& d) { return KFS_InsertKeyF(d.stream, &d.at, 1, nullptr, 0, 0); }},
    {"insert in external form",
     [](Draw const& d) { return KFS_InsertKey(d.stream, &d.at, 1, Numbers, KFS_Interp_Spline, KFS_Interp_Spline); }},
    {"set", [](Draw const& d) { return KFS_SetKeyF(d.stream, d.index, Numbers, KFS_Interp_Spline, 0); }},
    {"remove",
     [](Draw const& d) { return d.stream->GetKeyCount() > Keys / 2 ? KFS_RemoveKey(d.stream, d.index, nullptr) : 0; }},
    {"velocity", [](Draw const& d) { return KFS_SetKeyVelocityF(d.stream, d.index, Numbers, Numbers); }},
    {"continuous", [](Draw const& d) { return KFS_SetKeyContinuous(d.stream, 1, d.index); }},
    {"modifiable", [](Draw const& d) { return KFS_SetKeyModifiable(d.stream, 1, d.index); }},
    {"path tangents",
     [](Draw const& d) {
         return d.stream->IsSpatial() ? KFS_SetKeySpaceTangentsF(d.stream, d.index, 0, Numbers, Numbers) : 0;
     }},
    {"float", [](Draw const& d) { return d.stream->IsSpatial() ? KFS_SetKeyFloat(d.stream, 1, d.index) : 0; }},
    {"copies", [](Draw const& d) { return KFS_CopyKeys(&d.donor, nullptr, d.stream); }},
    {"copy of a constant", [](Draw const& d) { return KFS_CopyKeys(&d.constant, nullptr, d.stream); }},
    {"constant and back",
     [](Draw const& d) {
         int const code = FirstOf({d.stream->SetConstant(1, 0), d.stream->SetConstant(0, 0)});
         return code != 0 ? code : KFS_CopyKeys(&d.donor, nullptr, d.stream);
     }},
    {"rescale",
     [](Draw const& d) {
         return KFS_RescaleStream(d.stream, d.stream->GetTimeScale() == 600 ? 24 : 600);  // and stays so for a while
     }},
    {"description",
     [](Draw const& d) {
         KFS_ValueDesc const old = *d.stream->GetValueDesc();
         KFS_ValueDesc bytes = old;
         bytes.dataType = KFS_Type_U8;
         return FirstOf(
             {KFS_SetValueDescription(d.stream, &bytes, nullptr), KFS_SetValueDescription(d.stream, &old, nullptr)});
     }},
    {"arc-length parametrisation",
     [](Draw const& d) {
         return d.stream->IsSpatial() ? KFS_SetStreamSParametrize(d.stream, d.stream->IsSParametrized() ? 0 : 1) : 0;
     }},
    {"multiplier",
     [](Draw const& d) { return d.stream->IsSpatial() ? KFS_SetStreamMultiplier(d.stream, Numbers, nullptr) : 0; }},
    {"automatic path",
     [](Draw const& d) {
         return FirstOf(
             {KFS_SetStreamSpInterp(d.stream, KFS_SpInterp_None),
              KFS_SetStreamSpInterp(d.stream, d.stream->IsSpatial() ? KFS_SpInterp_Auto : KFS_SpInterp_None)});
     }},
    {"expression",
     [](Draw const& d) {
         KFS_SetStreamExpression(d.stream, Text("not run"));
         KFS_SetStreamExpression(d.stream, u16str());
         return 0;
     }},
    {"swap",
     [](Draw const& d) {
         d.stream->swap(d.donor);
         d.donor.swap(*d.stream);
         return 0;
     }},
};

// The host's gate: the main thread holds its edits until every render has its copies. From then on reads and edits run
// side by side.
TEST_F(RenderThreads, RendersSeeTheStreamsAsTheyStoodWhileTheMainThreadEdits)
{
    std::vector<double> const asTheyStood = Sample();
    std::mt19937 random(11);
    Edit(random);  // leaves stale ranges for the copies to repair
    std::vector<double> const expected = [&] {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        return Sample();
    }();
    ASSERT_NE(asTheyStood, expected);
    auto const stale = plain.Stale();
    auto const arcStale = spatial.ArcStale();

    std::atomic<int> ready{0}, done{0}, differing{0};
    std::atomic<bool> go{false};
    std::vector<std::thread> renders;
    for (int r = 0; r < Renders; ++r) {
        renders.emplace_back([&] {
            Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
            std::vector<double> const first = Sample();  // under the gate: nobody edits
            ++ready;
            while (!go) std::this_thread::yield();
            for (int pass = 0; pass < 3; ++pass)
                if (Sample() != expected || first != expected) ++differing;
            ++done;
        });
    }
    while (ready < Renders) std::this_thread::yield();
    EXPECT_EQ(stale, plain.Stale()) << "renders repair their copies alone";
    EXPECT_EQ(arcStale, spatial.ArcStale());
    go = true;
    int edits = 0;
    do {
        Edit(random);
        ++edits;
    } while (done < Renders);
    for (std::thread& render : renders) render.join();
    EXPECT_EQ(0, differing);
    EXPECT_GT(edits, 1);
    EXPECT_NE(expected, Sample());
}

// A span over a few keys, with a bag.
struct Frame final : KFS_RenderOptionsBase {
    T_Time const* GetTimeSpanStart() const override { return &start; }
    void SetTimeSpanStart(T_Time const*) override {}
    T_Time const* GetTimeSpanDuration() const override { return &duration; }
    void SetTimeSpanDuration(T_Time const*) override {}
    T_Time const* GetShutterDuration() const override { return &shutter; }
    void GetShutterSpan(int, T_Time*, T_Time*) const override {}
    KFS_ParamBag const* GetParamBag() const override { return &bag; }

    T_Time start{130, 600}, duration{200, 600}, shutter{0, 1};
    KFS_ParamBag bag;
};

class TreeRenders : public SceneTest {
protected:
    TestRoot<TestIndexedGroup> root{"layers"};
    std::vector<KFS_Stream*> leaves;

    TreeRenders()
    {
        for (int n = 0; n < 3; ++n) {
            Q_ScAutoPtr<KFS_StreamBase> made = TestKinds::Make("opacity");
            leaves.push_back(root.GetEditableStream(root.AppendStream(&made))->GetAsLeaf());
            EXPECT_EQ(0, leaves.back()->SetConstant(0, 0));
            for (int i = 0; i < Keys; ++i) {
                T_Time const at{i * 60, 600};
                double const value = i * i * (n + 1) % 100;
                EXPECT_EQ(0, KFS_InsertKeyF(leaves.back(), &at, 1, &value, KFS_Interp_Spline, KFS_Interp_Spline));
            }
        }
    }
};

// What is computed when first asked for (a bag's GUID, what identifies a stream in it, the expression's record) is asked
// for by all at once.
TEST_F(TreeRenders, OverriddenValuesAndIdentitiesAreTheSameInAllOfThem)
{
    Frame shared;
    shared.bag.AddOverride(leaves[0], boost::make_shared<KFS_StreamOverride>(
                                          leaves[0], KFS_OverrideValue(std::vector<double>{1.0}), false));
    shared.bag.AddOverride(leaves[1],
                           boost::make_shared<KFS_StreamOverride>(
                               leaves[1], KFS_OverrideValue(std::vector<double>{3.0}), leaves[2], T_Time{10, 600},
                               [](T_Time const& time, KFS_OverrideValue& value) {
                                   boost::get<std::vector<double>>(value)[0] += time.value;
                               },
                               hearth::utility::Guid(), false));
    using Answers = std::pair<std::vector<double>, std::vector<hearth::utility::Guid>>;
    constexpr int Step = 50;
    auto const ask = [&] {
        Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
        Answers answers;
        for (int time = 0; time < Span; time += Step) {
            for (KFS_Stream const* const leaf : leaves) {
                T_Time const moment{time, 600};
                EXPECT_EQ(0, KFS_GetValueFPlus(leaf, &moment, 0, &answers.first.emplace_back(), nullptr, &shared.bag));
                leaf->GetExprInfo().AddDependency(time);
            }
        }
        answers.second = {root.GetRenderGuid(shared, nullptr), shared.bag.GetGUID()};
        return answers;
    };
    std::vector<Answers> answers(Renders);
    std::atomic<int> done{0};
    std::vector<std::thread> renders;
    for (Answers& answer : answers)
        renders.emplace_back([&] {
            answer = ask();
            ++done;
        });
    std::size_t dependencies = 0;
    while (done < Renders) {
        std::size_t const now = leaves[0]->GetExprInfo().GetDependencyIds().size();
        EXPECT_LE(dependencies, now);
        dependencies = now;
    }
    for (std::thread& render : renders) render.join();

    Answers const expected = ask();
    EXPECT_EQ(1.0, expected.first[3]);
    EXPECT_EQ(3.0 + Step, expected.first[4]);
    for (Answers const& answer : answers) EXPECT_TRUE(expected == answer);
    EXPECT_EQ(static_cast<std::size_t>(Span / Step), leaves[0]->GetExprInfo().GetDependencyIds().size());
}

TEST_F(RenderThreads, ReportsOfRendersDontMix)
{
    TestStream const empty;
    std::atomic<int> wrong{0};
    std::vector<std::thread> renders;
    for (int r = 0; r < 4; ++r) {
        renders.emplace_back([&] {
            Q_ScSetCurrentRenderContext const current(kfshost::MakeRenderContext(true));
            T_Time const at{0, 600};
            double value = 0.0;
            for (int i = 0; i < 100; ++i)
                if (KFS_GetValueFPlus(empty, &at, 0, &value, nullptr, nullptr) != 7427) ++wrong;
        });
    }
    for (std::thread& render : renders) render.join();
    EXPECT_EQ(0, wrong);
    std::vector<Reported> const seen = reports.Take();
    EXPECT_EQ(400u, seen.size());
    for (Reported const& report : seen)
        ASSERT_EQ(KfsReport(36, "attempt to get a value from a time stream with no key values."), report);
}

}  // namespace
