#include "curves/interpolate_private.h"

#include "tests/curves/keyedstream.h"

#include <cmath>
#include <limits>

namespace {

using InterpolateTest = StreamTest;

constexpr double Untouched = -4321.0;

void PresetCache(KFS_Stream const* stream)
{
    std::fill_n(KFSp_Numbers(stream->GetCache()), stream->GetDimension(), Untouched);
}

std::vector<double> Cached(KFS_Stream const* stream)
{
    double const* const numbers = KFSp_Numbers(stream->GetCache());
    return {numbers, numbers + stream->GetDimension()};
}

using Interpolator = int (*)(KFS_Stream const*, long, int, int);

std::vector<double> Evaluate(Interpolator interpolator, KFS_Stream const* stream, int time, int hint)
{
    PresetCache(stream);
    EXPECT_EQ(0, interpolator(stream, 0, time, hint)) << "at " << time << " with hint " << hint;
    return Cached(stream);
}

// The true curve of a segment: handles as speed and influence, a linear side's on the chord at 0.16666666667.
struct Truth {
    long double x[4];
    long double y[4];

    Truth(KFS_KeyScalar const* a, KFS_KeyScalar const* b, int dimension, int i, unsigned int scale)
    {
        auto const from = KFSp_GetTemporalRuns(a, dimension);
        auto const to = KFSp_GetTemporalRuns(b, dimension);
        long double const dt = (static_cast<long double>(b->time) - a->time) / scale;
        long double const rise = static_cast<long double>(to.value[i]) - from.value[i];
        bool const outLinear = a->outInterp == KFS_Interp_Linear;
        bool const inLinear = b->inInterp == KFS_Interp_Linear;
        long double const out = outLinear ? 0.16666666667L : from.outInfluence[i];
        long double const in = inLinear ? 0.16666666667L : to.inInfluence[i];
        long double const outSlope = outLinear ? rise / dt : from.outSpeed[i];
        long double const inSlope = inLinear ? rise / dt : to.inSpeed[i];
        x[0] = 0.0L;
        x[1] = out * dt;
        x[2] = dt - in * dt;
        x[3] = dt;
        y[0] = from.value[i];
        y[1] = y[0] + out * dt * outSlope;
        y[3] = to.value[i];
        y[2] = y[3] - in * dt * inSlope;
    }
    long double ValueAt(long double seconds) const { return CubicAt(y, SolveCubic(x, seconds)); }
    long double SlopeAt(long double seconds) const
    {
        long double const t = SolveCubic(x, seconds);
        return CubicSlopeAt(y, t) / CubicSlopeAt(x, t);
    }
};

// Random keys with random handles, of every pair of codes that has a curve.
KeyedStream MakeRandom(std::mt19937& random, short dimension, unsigned int scale)
{
    std::uniform_real_distribution<double> value(-100.0, 100.0);
    std::uniform_real_distribution<double> influence(0.02, 0.98);
    std::uniform_int_distribution<int> step(20, 3000);
    std::uniform_int_distribution<int> code(KFS_Interp_Linear, KFS_Interp_Spline);
    KeyedStream stream({.dimension = dimension, .timeScale = scale});
    int time = -5000;
    for (int k = 0; k < 12; ++k) {
        std::vector<double> values;
        for (int i = 0; i < dimension; ++i) values.push_back(value(random));
        stream.Key(time += step(random), values, KFS_Interp_Spline);
    }
    stream.Settle();
    for (int k = 0; k < stream.Count(); ++k) {
        stream.Codes(k, code(random), code(random));
        for (int i = 0; i < dimension; ++i)
            stream.SetHandle(k, {value(random), influence(random), value(random), influence(random)}, i);
    }
    return stream;
}

TEST_F(InterpolateTest, ValuesAndSpeedsAreThoseOfTheTrueCurve)
{
    std::mt19937 random(20240607);
    for (short const dimension : {1, 2, 3, 4}) {
        for (unsigned int const scale : {25U, 600U, 254016000U}) {
            KeyedStream const stream = MakeRandom(random, dimension, scale);
            for (int k = 0; k + 1 < stream.Count(); ++k) {
                KFS_KeyScalar const* const a = stream.Record(k);
                KFS_KeyScalar const* const b = stream.Record(k + 1);
                bool const straight = a->outInterp == KFS_Interp_Linear && b->inInterp == KFS_Interp_Linear;
                for (int part = 1; part < 8; ++part) {
                    int const time = a->time + (b->time - a->time) * part / 8;
                    SCOPED_TRACE(testing::Message() << dimension << " components, segment " << k << ", at " << time);
                    std::vector<double> const values = Evaluate(KFSp_Interpolate, stream, time, k);
                    std::vector<double> const speeds = Evaluate(KFSp_InterpDeriv, stream, time, k);
                    for (int i = 0; i < dimension; ++i) {
                        Truth const truth(a, b, dimension, i, scale);
                        long double const seconds = (static_cast<long double>(time) - a->time) / scale;
                        auto const index = static_cast<std::size_t>(i);
                        if (straight) {
                            double const f = static_cast<double>(time - a->time) / (b->time - a->time);
                            double const va = KFSp_Numbers(a)[i];
                            EXPECT_EQ(va + (KFSp_Numbers(b)[i] - va) * f, values[index]);
                            EXPECT_EQ(Untouched, speeds[index]) << "a straight segment's speed isn't computed here";
                            continue;
                        }
                        double const size = 1.0 + std::fabs(static_cast<double>(truth.y[1])) +
                                            std::fabs(static_cast<double>(truth.y[2]));
                        double const slope = static_cast<double>(truth.SlopeAt(seconds));
                        // The solver may be off by 1e-13 of the segment in x, which counts as much in y as the curve is
                        // steep.
                        double const steepness = 1.0 + std::fabs(slope * static_cast<double>(truth.x[3]));
                        EXPECT_NEAR(static_cast<double>(truth.ValueAt(seconds)), values[index],
                                    1e-11 * (size + steepness));
                        EXPECT_NEAR(slope, speeds[index], 1e-7 * (1.0 + std::fabs(slope)) * steepness);
                    }
                }
            }
        }
    }
}

// The hint saves a search and must not show in any bit, on any kind of stream.
TEST_F(InterpolateTest, AWrongHintChangesNothing)
{
    std::mt19937 random(7);
    for (bool const spatialFlags : {false, true}) {
        KeyedStream stream = MakeRandom(random, 3, 600);
        std::uniform_int_distribution<int> any(stream.Record(0)->time + 1, stream.Record(11)->time - 1);
        for (int n = 0; n < 300; ++n) {
            int const time = any(random);
            if (spatialFlags) stream.Flag(n % 12, KFS_KeyFlag_Float);
            for (Interpolator const interpolator : {&KFSp_Interpolate, &KFSp_InterpDeriv}) {
                std::vector<double> const expected = Evaluate(interpolator, stream, time, KFS_INVALID_INDEX);
                for (int hint = -2; hint < 14; ++hint)
                    EXPECT_EQ(expected, Evaluate(interpolator, stream, time, hint)) << time << " " << hint;
                EXPECT_EQ(expected, Evaluate(interpolator, stream, time, std::numeric_limits<int>::max()));
            }
        }
    }
}

// A time that stands on a key isn't bracketed by the hint: the answer is that of the search, from the key before to the
// key after.
TEST_F(InterpolateTest, TheHintBracketsStrictly)
{
    KeyedStream const stream = MakeKeyed({{0, 0.0}, {100, 7.0}, {400, 40.0}}, KFS_Interp_Linear);
    for (int const hint : {-1, 0, 1})
        EXPECT_EQ(std::vector<double>{10.0}, Evaluate(KFSp_Interpolate, stream, 100, hint)) << hint;
}

TEST_F(InterpolateTest, OtherPairsOfCodesWriteNothing)
{
    KeyedStream stream = MakeKeyed({{0, 1.0}, {600, 2.0}}, KFS_Interp_Spline);
    for (int out = -1; out <= 4; ++out) {
        for (int in = -1; in <= 4; ++in) {
            bool const shaped = (out == KFS_Interp_Linear || out == KFS_Interp_Spline) &&
                                (in == KFS_Interp_Linear || in == KFS_Interp_Spline);
            bool const straight = out == KFS_Interp_Linear && in == KFS_Interp_Linear;
            stream.Codes(0, KFS_Interp_Linear, out).Codes(1, in, KFS_Interp_Linear);
            EXPECT_EQ(shaped, Evaluate(KFSp_Interpolate, stream, 300, 0)[0] != Untouched) << out << " to " << in;
            stream.At(600);
            // A read has the earlier key's value there.
            bool const holds = out == KFS_Interp_Hold || in == KFS_Interp_Hold;
            EXPECT_TRUE(shaped || holds || stream.At1(300) == 1.0) << out << " to " << in;
            EXPECT_EQ(shaped && !straight, Evaluate(KFSp_InterpDeriv, stream, 300, 0)[0] != Untouched)
                << out << " to " << in;
        }
    }
}

TEST_F(InterpolateTest, NonDecreasingStreamsNeverFall)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 3.0}}, KFS_Interp_Spline);
    stream.SetHandle(0, {0, 0, -40, 0.6}).SetHandle(1, {-30, 0.4, 0, 0});
    double previous = 0.0;
    for (int time = 5; time < 600; time += 5) {
        stream.StreamFlag(KFS_StreamFlag_NonDecreasing, false);
        double const raw = Evaluate(KFSp_Interpolate, stream, time, 0)[0];
        stream.StreamFlag(KFS_StreamFlag_NonDecreasing);
        double const value = Evaluate(KFSp_Interpolate, stream, time, 0)[0];
        EXPECT_TRUE(value >= previous - 1e-12 && value <= 3.0) << value << ", untreated " << raw;
        EXPECT_GE(Evaluate(KFSp_InterpDeriv, stream, time, 0)[0], -1e-6) << "the speed is the treated curve's";
        EXPECT_TRUE(time != 100 || raw < -1.0) << "there is something to treat: " << raw;
        previous = value;
    }
    // Straight segments of such a stream may fall: no curve is involved.
    KeyedStream falling = MakeKeyed({{0, 8.0}, {400, 0.0}}, KFS_Interp_Linear);
    falling.StreamFlag(KFS_StreamFlag_NonDecreasing);
    EXPECT_EQ(std::vector<double>{6.0}, Evaluate(KFSp_Interpolate, falling, 100, 0));
}

TEST_F(InterpolateTest, TheFirstFailingComponentEndsIt)
{
    KeyedStream stream = MakeKeyed({{0, 0.0}, {600, 2.0}}, KFS_Interp_Spline, {.dimension = 3});
    for (int i = 0; i < 3; ++i) stream.SetHandle(0, {0, 0, 2, 1.0 / 3.0}, i).SetHandle(1, {2, 1.0 / 3.0, 0, 0}, i);
    stream.SetHandle(1, {std::numeric_limits<double>::infinity(), 0.2, 0, 0}, 1);
    for (Interpolator const interpolator : {&KFSp_Interpolate, &KFSp_InterpDeriv}) {
        PresetCache(stream);
        EXPECT_EQ(CRV_Err_NotFinite, interpolator(stream, 0, 300, 0));
        std::vector<double> const cached = Cached(stream);
        EXPECT_TRUE(cached[0] != Untouched && cached[1] == Untouched && cached[2] == Untouched);
    }
}

TEST_F(InterpolateTest, WithoutKeysItIsReportedWithoutComponentsThereIsNothingToDo)
{
    TestStream const empty;
    KeyedStream const none = MakeKeyed({{0, 0.0}, {600, 0.0}}, KFS_Interp_Spline, {.dimension = 0});
    for (Interpolator const interpolator : {&KFSp_Interpolate, &KFSp_InterpDeriv}) {
        EXPECT_EQ(KFS_Err_NoKeys, interpolator(empty, 0, 10, 0));
        EXPECT_REPORT(reports, 85, NoKeysText("inquire about a key value in"));
        EXPECT_EQ(0, interpolator(none, 0, 300, 0));
    }
}

}  // namespace
