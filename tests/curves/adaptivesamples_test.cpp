#include "curves/adaptivesamples.h"

#include "curves/tangents.h"
#include "frame/services/debug.h"
#include "frame/services/memory.h"
#include "overrides/streamexpression.h"
#include "tests/support/dice.h"
#include "tests/support/streams.h"
#include "tests/support/text.h"

#include <algorithm>
#include <cmath>
#include <utility>

namespace {

struct Sample {
    double x, y;
    bool operator==(Sample const&) const = default;
};

class NeverAbort : public KFS_AbortChecker {
public:
    explicit NeverAbort(int answer = 0) : answer_(answer) {}
    int CheckAbort() const override { return ++asked, answer_; }
    mutable int asked = 0;

private:
    int answer_;
};

// Divides while the chord is off by more than *refCon at one of three places.
int Flat(void* refCon, unsigned int, double t0, double t1, double* start, double* end, CRV_Curve const* curve,
         unsigned char* divide)
{
    for (double const share : {0.25, 0.5, 0.75}) {
        double point[2];
        if (int const code = CRV_EvaluatePoint(curve, point, t0 + (t1 - t0) * share)) return code;
        double const width = end[0] - start[0];
        double const along = width > 0 ? (point[0] - start[0]) / width : 0.5;
        if (std::fabs(start[1] + (end[1] - start[1]) * along - point[1]) > *static_cast<double*>(refCon)) *divide = 1;
    }
    return 0;
}

class AdaptiveSamples : public StreamTest {
protected:
    ~AdaptiveSamples() override { EXPECT_EQ(0, SEQ_Dispose(out_.samples, 0)); }

    void Empty()
    {
        if (out_.samples) EXPECT_EQ(0, SEQ_Dispose(std::exchange(out_.samples, nullptr), 0));
        EXPECT_EQ(0, SEQ_New(0, sizeof(Sample), 4, 1, &out_.samples));
    }

    int Build(KFS_Stream* stream, T_Time start, T_Time duration, short dimension = 0, double tolerance = 1e-3,
              KFS_AdaptiveTransformFunc* transform = nullptr, KFS_AdaptiveSplitFunc* split = nullptr)
    {
        Empty();
        return KFS_GetAdaptiveSampleStream(dimension, stream, &start, &duration, transform, split, Flat, &tolerance,
                                           &out_, &least_, &greatest_, aborter_);
    }
    std::vector<Sample> Samples() const
    {
        std::vector<Sample> samples;
        void const* item = nullptr;
        for (int i = 0; i < (*out_.samples)->count; ++i) {
            EXPECT_EQ(0, SEQ_GetConstAddress(out_.samples, i, &item));
            samples.push_back(*static_cast<Sample const*>(item));
        }
        return samples;
    }
    // Walks from `from` at a step and hands each x, slope and value to `look`.
    template <class Look>
    void Walk(double from, double step, int steps, Look&& look)
    {
        KFS_AdaptiveSampleStreamCache cache;
        double* samples = nullptr;
        int count = 0, next = -1;
        ASSERT_EQ(0, KFS_InitIterateAdaptiveSampleStream(&out_, &samples, &count, &next, &cache));
        for (int i = 0; i < steps; ++i) {
            double slope = -1, value = -1;
            double const x = from + i * step;
            EXPECT_EQ(0,
                      KFS_IterateAdaptiveSampleStream(x, step, &out_, samples, count, &next, &cache, &slope, &value));
            look(x, slope, value);
        }
        EXPECT_EQ(1, SEQ_GetPinCount(out_.samples));
        EXPECT_EQ(0, KFS_CompleteIterateAdaptiveSampleStream(&out_));
        EXPECT_EQ(0, SEQ_GetPinCount(out_.samples));
    }

    KFS_AdaptiveSampleStream out_;
    NeverAbort aborter_;
    double least_ = -99, greatest_ = -99;
};

// Of the tolerance that the samples were asked for: a walk adds up, and three places a piece don't see all of a curve.
TEST_F(AdaptiveSamples, FollowTheStream)
{
    constexpr double Tolerance = 1e-3;
    for (int round = 0; round < Rounds(150); ++round) {
        SCOPED_TRACE(testing::Message() << "round " << round);
        Dice dice(static_cast<std::uint64_t>(round));
        TestStream stream({.dimension = static_cast<short>(1 + dice.Below(3)), .timeScale = 100});
        int const keys = 2 + dice.Below(6);
        for (int i = 0; i < keys; ++i) {
            // Reached by a hold, a segment jumps where it begins, unlike the stream.
            char const in = static_cast<char>(1 + dice.Below(2)), out = static_cast<char>(1 + dice.Below(3));
            stream.Key(100 * i + dice.Below(80), {dice.Between(-1, 1), dice.Between(-1, 1), dice.Between(-1, 1)}, in,
                       out);
        }
        short const component = static_cast<short>(dice.Below(stream->GetDimension()));
        T_Time const start{dice.Below(300) - 50, 100};
        T_Time const duration{1 + dice.Below(400), 100};
        ASSERT_EQ(0, Build(stream, start, duration, component, Tolerance));
        EXPECT_EQ(0, stream.Pins());
        std::vector<Sample> const samples = Samples();
        ASSERT_FALSE(samples.empty());
        double least = samples[0].y, greatest = samples[0].y;
        for (std::size_t i = 0; i < samples.size(); ++i) {
            if (i > 0) EXPECT_LE(samples[i - 1].x, samples[i].x);
            least = std::min(least, samples[i].y);
            greatest = std::max(greatest, samples[i].y);
        }
        EXPECT_EQ(least, least_);
        EXPECT_EQ(greatest, greatest_);
        if (samples.size() == 1) continue;  // beside the keys
        std::vector<int> const times = stream.Times();
        int i = 0;
        Walk(start.value / 100.0, 0.01, duration.value, [&](double x, double, double value) {
            int const time = start.value + i++;
            if (std::count(times.begin(), times.end(), time) > 0) return;  // where a hold ends there are two values
            EXPECT_NEAR(stream.At(time)[static_cast<std::size_t>(component)], value, 4 * Tolerance) << "at " << x;
        });
        if (HasFailure()) return;
    }
}

// What comes of streams that are no curve, and of segments that jump.
TEST_F(AdaptiveSamples, OfStreamsThatAreNoCurve)
{
    constexpr char L = KFS_Interp_Linear, H = KFS_Interp_Hold;
    TestStream const constant({.noKeys = true}), empty;
    TestStream single, stairs, other;
    single.Key(600, {7});
    stairs.Key(600, {1}, L, H).Key(1200, {3}, L, L).Key(1800, {5}, H, L).Key(2400, {4}, L, L);
    EXPECT_EQ(0, Build(constant, {0, 1}, {9, 1}));
    EXPECT_EQ(0, Build(empty, {0, 1}, {9, 1}));
    EXPECT_EQ(std::vector<Sample>(), Samples());
    EXPECT_EQ(-99, least_);
    EXPECT_EQ(0, Build(single, {20, 1}, {9, 1}));
    EXPECT_EQ((std::vector<Sample>{{1, 7}}), Samples());
    EXPECT_EQ(7, least_);

    struct Row {
        int start, duration;
        std::vector<Sample> expected;
    };
    // In half seconds. The keys lie at 1, 2, 3 and 4 seconds.
    for (Row const& row : {Row{0, 16, {{1, 1}, {2, 1}, {2, 3}, {2, 5}, {3, 5}, {4, 4}}}, Row{3, 1, {{1.5, 1}, {2, 1}}},
                           Row{3, 2, {{1.5, 1}, {2, 1}, {2, 3}, {2, 5}, {2.5, 5}}}, Row{7, 9, {{3.5, 4.5}, {4, 4}}},
                           Row{0, 1, {{1, 1}}}, Row{20, 1, {{4, 4}}}}) {
        SCOPED_TRACE(row.start);
        ASSERT_EQ(0, Build(stairs, {row.start, 2}, {row.duration, 2}));
        EXPECT_EQ(row.expected, Samples());
    }
    // Nothing given, nothing done; what can't be had is refused.
    T_Time const time{0, 1};
    double tolerance = 1;
    EXPECT_EQ(0, KFS_GetAdaptiveSampleStream(0, nullptr, &time, &time, nullptr, nullptr, Flat, &tolerance, &out_,
                                             &least_, &greatest_, aborter_));
    for (short const dimension : {short{-1}, short{1}}) EXPECT_EQ(3, Build(stairs, time, {9, 1}, dimension));
}

TEST_F(AdaptiveSamples, AsksTheCallbacks)
{
    TestStream stream;
    stream.Key(0, {1}).Key(600, {2}).Key(1200, {4});
    auto const negate = [](void*, double* value) { return *value = -*value, *value < -3 ? 77 : 0; };
    EXPECT_EQ(77, Build(stream, {0, 1}, {2, 1}, 0, 1e-3, negate));
    EXPECT_EQ((std::vector<Sample>{{0, -1}, {1, -2}}), Samples()) << "what stood before the failure stays";
    EXPECT_EQ(-2, least_);
    EXPECT_EQ(0, stream.Pins());

    // Each segment as two, through a point of the caller's; the second segment is left out.
    auto const split = [](void*, CRV_Curve* curve, SEQ_Head*** pieces) {
        if (curve->p0[0] > 0.5) return 0;
        EXPECT_EQ(0, SEQ_New(0, sizeof(Sample), 4, 1, pieces));
        Sample const start{curve->p0[0], curve->p0[1]}, end{curve->p3[0], curve->p3[1]}, middle{0.5, 10};
        for (Sample const& point : {start, start, middle, middle, middle, end, end, end})
            EXPECT_EQ(0, SEQ_Insert(&point, -1, *pieces));
        return 0;
    };
    EXPECT_EQ(0, Build(stream, {0, 1}, {2, 1}, 0, 1e3, nullptr, split));
    EXPECT_EQ((std::vector<Sample>{{0, 1}, {0.5, 10}, {1, 2}}), Samples());

    // A test that throws leaves nothing behind, and a curve that turns back in x gives no sample left of the farthest.
    Empty();
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    auto const throws = [](void*, unsigned int, double, double, double*, double*, CRV_Curve const*,
                           unsigned char*) -> int { throw 88; };
    for (CRV_SampleFunc* const test : {static_cast<CRV_SampleFunc*>(throws), &Flat}) {
        auto const fold = [](void*, CRV_Curve* curve, SEQ_Head*** pieces) {
            Sample const start{curve->p0[0], 0}, out{curve->p3[0] + 5, 9}, in{curve->p0[0] - 5, 9},
                end{curve->p3[0], 1};
            EXPECT_EQ(0, SEQ_New(0, sizeof(Sample), 4, 1, pieces));
            for (Sample const& point : {start, out, in, end}) EXPECT_EQ(0, SEQ_Insert(&point, -1, *pieces));
            return 0;
        };
        double tolerance = 1e-2;
        T_Time const start{1, 10}, duration{2, 1};
        Empty();
        EXPECT_EQ(test == &Flat ? 0 : 88,
                  KFS_GetAdaptiveSampleStream(0, stream, &start, &duration, nullptr, fold, test, &tolerance, &out_,
                                              &least_, &greatest_, aborter_));
        std::vector<Sample> const samples = Samples();
        EXPECT_TRUE(std::ranges::is_sorted(samples, {}, &Sample::x));
        EXPECT_EQ(test == &Flat, samples.size() > 5);
        EXPECT_EQ(0, stream.Pins());
    }
    Empty();
    EXPECT_EQ(before, Q_MemoryLive(nullptr));

    KFS_SetStreamExpression(stream, Text("x"));
    for (bool const mayAbort : {false, true}) {
        hearth::debug::DebugDatabase::Instance().SetEntry("KFS_AllowAbortAudio", mayAbort ? "1" : nullptr);
        NeverAbort const aborting(5);
        Empty();
        T_Time const start{0, 1}, duration{1, 1};
        EXPECT_EQ(mayAbort ? 5 : 0, KFS_GetAdaptiveSampleStream(0, stream, &start, &duration, nullptr, nullptr, Flat,
                                                                nullptr, &out_, &least_, &greatest_, aborting));
        std::vector<Sample> const samples = Samples();
        ASSERT_EQ(mayAbort ? 1u : 32u, samples.size());
        EXPECT_EQ(mayAbort ? 1 : 0, aborting.asked);
        EXPECT_EQ(samples.back().x, static_cast<double>(samples.size() - 1) / 30);
        EXPECT_EQ(samples.back().y, greatest_);
    }
    hearth::debug::DebugDatabase::Instance().SetEntry("KFS_AllowAbortAudio", nullptr);
}

TEST_F(AdaptiveSamples, AreWalkedFromEndToEnd)
{
    double* samples = nullptr;
    int count = 0, next = 0;
    KFS_AdaptiveSampleStreamCache cache;
    Empty();
    EXPECT_NE(0, KFS_InitIterateAdaptiveSampleStream(&out_, &samples, &count, &next, &cache));
    EXPECT_EQ(0, SEQ_GetPinCount(out_.samples));
    for (Sample const& sample : {Sample{1, 10}, Sample{2, 20}, Sample{2, 40}, Sample{2, 30}, Sample{4, 10}})
        ASSERT_EQ(0, SEQ_Insert(&sample, -1, out_.samples));
    struct Seen {
        double slope, value;
        bool operator==(Seen const&) const = default;
    };
    std::vector<Seen> seen;
    Walk(0.5, 0.5, 9, [&](double, double slope, double value) { seen.push_back({slope, value}); });
    EXPECT_EQ(
        (std::vector<Seen>{{0, 10}, {10, 10}, {10, 15}, {-10, 30}, {-10, 25}, {-10, 20}, {-10, 15}, {0, 10}, {0, 10}}),
        seen);
    Walk(3, 0.25, 2, [&](double, double slope, double value) { seen.push_back({slope, value}); });
    EXPECT_EQ((Seen{-10, 17.5}), seen.back());
}

}  // namespace
