#include "host/import.h"
#include "host/rotations.h"
#include "tests/host/hosttest.h"

#include <cmath>
#include <map>
#include <numbers>
#include <numeric>

using kfshost::ImportOptions;
using kfshost::Rational;
using kfshost::Scene;
using kfshost::StreamItem;
using nlohmann::json;

namespace {

class GltfValues : public HostTest, public testing::WithParamInterface<char const*> {};

StreamItem const* FindChannel(Scene const& scene, json const& channel)
{
    std::string const place = "animations[" + std::to_string(channel.at("anim").get<int>()) + "].channels[" +
                              std::to_string(channel.at("channel").get<int>()) + ']';
    auto const item = std::ranges::find(scene.streams, place, &StreamItem::place);
    return item == scene.streams.end() ? nullptr : &*item;
}

double RangeOf(json const& values)
{
    double low = HUGE_VAL;
    double high = -HUGE_VAL;
    for (json const& row : values) {
        for (double const value : row) {
            low = std::min(low, value);
            high = std::max(high, value);
        }
    }
    return high > low ? high - low : std::max(std::abs(high), 1.0);
}

// What a curve has within a stretch of time: its value must be met in it, since keys and samples are where the scale
// has a unit for them.
struct Met {
    double low = HUGE_VAL;
    double high = -HUGE_VAL;

    void Add(double value)
    {
        low = std::min(low, value);
        high = std::max(high, value);
    }
};

std::vector<Met> MetAround(StreamItem const& item, Rational const& time, double seconds)
{
    unsigned int const scale = item.stream->GetTimeScale();
    auto const reach = static_cast<std::int64_t>(std::ceil(seconds * scale));
    std::vector<double> row(item.components.size());
    std::vector<Met> met(row.size());
    for (std::int64_t const units :
         {time.ToUnits(scale) - reach, std::int64_t{time.ToUnits(scale)}, time.ToUnits(scale) + reach}) {
        kfshost::ReadAt(*item.stream, Rational(units, scale), row.data());
        for (std::size_t d = 0; d < row.size(); ++d) met[d].Add(row[d]);
    }
    return met;
}

// The greatest angle between an arc and its chord, for rotations so far apart: the tangent of the turned share of half
// the angle, which is the angle between the quaternions.
double ArcDeviation(double between)
{
    double worst = 0.0;
    for (int i = 1; i < 2000; ++i) {
        double const u = i / 2000.0;
        double const chord = std::atan2(u * std::sin(between), 1.0 - u + u * std::cos(between));
        worst = std::max(worst, 2.0 * std::abs(chord - u * between));
    }
    return worst;
}

using Row = std::vector<double>;

double Dot(Row const& a, Row const& b)
{
    return std::inner_product(a.begin(), a.end(), b.begin(), 0.0);
}

Row ReadRow(KFS_Stream const& stream, Rational const& time)
{
    Row row(static_cast<std::size_t>(stream.GetDimension()));
    kfshost::ReadAt(stream, time, row.data());
    return row;
}

// The keys around a time, and how far it is from the one to the other.
struct Segment {
    Row before, after;
    double share = 0.0;
};

Segment SegmentAt(KFS_Stream const& stream, Rational const& time)
{
    int end = 0;
    while (end + 1 < kfshost::KeyCount(stream) && kfshost::KeyTime(stream, end) <= time) ++end;
    Rational const from = kfshost::KeyTime(stream, std::max(end - 1, 0));
    Rational const to = kfshost::KeyTime(stream, end);
    return {ReadRow(stream, from), ReadRow(stream, to), from < to ? ((time - from) / (to - from)).ToDouble() : 0.0};
}

double Distance(Row const& a, Row const& b)
{
    double most = 0.0;
    for (std::size_t d = 0; d < a.size(); ++d) most = std::max(most, std::abs(a[d] - b[d]));
    return most;
}

// Whether a row is what lies between two keys of which one has its sign turned: the long way round.
bool IsLongWay(Segment const& segment, Row const& row)
{
    double plus = 0.0;
    double minus = 0.0;
    for (std::size_t d = 0; d < row.size(); ++d) {
        double const number = (1.0 - segment.share) * segment.before[d] - segment.share * segment.after[d];
        plus = std::max(plus, std::abs(number - row[d]));
        minus = std::max(minus, std::abs(number + row[d]));
    }
    return std::min(plus, minus) < 1e-6;
}

// Degrees between two rotations.
double AngleBetween(Row const& a, Row const& b)
{
    double const cosine = std::abs(Dot(a, b)) / std::sqrt(Dot(a, a) * Dot(b, b));
    return 2.0 * std::acos(std::min(cosine, 1.0)) * 180.0 / std::numbers::pi;
}

// Against the arc: off by what the documented bound says for the keys around, and by no more.
void CompareWithArc(StreamItem const& item, Rational const& time, Row const& slerp, double rounding)
{
    auto const [before, after, share] = SegmentAt(*item.stream, time);
    ASSERT_GE(Dot(before, after), 0.0) << item.path << ": neighbours of opposite sign at " << time.ToString();
    double const apart = AngleBetween(before, after);
    double const bound = kfshost::ArcDeviationBound(apart);
    EXPECT_LE(ArcDeviation(apart / 360.0 * std::numbers::pi) * 180.0 / std::numbers::pi, bound + 1e-9);
    // The lengths of keys, which are floats, and the angle's own rounding.
    ASSERT_LE(AngleBetween(ReadRow(*item.stream, time), slerp), bound + rounding * 360.0 * 120.0 + 1e-4)
        << item.path << " at " << time.ToString() << " s, keys " << apart << " degrees apart";
}

// `nearKeys`: whether the scale is fine enough to trust samples next to keys. A rotation's values are held up to their
// sign, and where a sign was turned between two keys only against the arc, not against the long way round.
void CompareChannel(StreamItem const& item, json const& channel, double keyRounding, bool nearKeys)
{
    // Some curves barely move; a number near 1 is good to some 1e-16.
    double const tolerance = std::max(1e-9 * RangeOf(channel.at("v")), 1e-14);
    std::string const kinds = channel.at("kind");
    bool const isSigned = item.kind != kfshost::StreamKind::Rotation || channel.at("interp") == "CUBICSPLINE";
    for (std::size_t i = 0; i < kinds.size(); ++i) {
        if (kinds[i] == 'n' && !nearKeys) continue;
        Rational const time = TimeOf(channel.at("t")[i]);
        bool const isExact = channel.at("interp") == "STEP" || kinds[i] == 'o' || (kinds[i] == 'k' && nearKeys);
        double const rounding = isExact ? 0.0 : keyRounding + RoundingOf(time, item.stream->GetTimeScale());
        std::vector<Met> const met = MetAround(item, time, rounding);
        auto expected = channel.at("v")[i].get<Row>();
        ASSERT_EQ(expected.size(), met.size());
        if (channel.contains("slerp"))
            ASSERT_NO_FATAL_FAILURE(CompareWithArc(item, time, channel.at("slerp")[i].get<Row>(), rounding));
        Row const found = ReadRow(*item.stream, time);
        double const sign = !isSigned && Dot(found, expected) < 0.0 ? -1.0 : 1.0;
        for (double& number : expected) number *= sign;
        bool const differs = Distance(found, expected) > tolerance;
        bool const isTurned =
            channel.contains("slerp") && differs && IsLongWay(SegmentAt(*item.stream, time), expected);
        for (std::size_t d = 0; d < met.size() && !isTurned; ++d) {
            double const allowed = isExact ? 0.0 : tolerance;
            ASSERT_TRUE(met[d].low - allowed <= expected[d] && expected[d] <= met[d].high + allowed)
                << item.path << ", component " << d << " at " << time.ToString() << " s, kind " << kinds[i]
                << ": expected " << expected[d] << ", found " << met[d].low << " to " << met[d].high;
        }
    }
}

// The finest scale that holds the span: a file's float times lose next to nothing in it.
unsigned int FinestScale(Scene const& scene)
{
    double longest = 0.1;
    for (StreamItem const& item : scene.streams) {
        int const keys = kfshost::KeyCount(*item.stream);
        longest = keys == 0 ? longest : std::max(longest, kfshost::KeyTime(*item.stream, keys - 1).ToDouble());
    }
    return 1U << static_cast<int>(std::floor(std::log2((1 << 30) / longest)));
}

void CompareFile(json const& expected, Scene const& scene, bool nearKeys)
{
    for (json const& channel : expected.at("channels")) {
        StreamItem const* const item = FindChannel(scene, channel);
        ASSERT_NE(nullptr, item) << channel.at("anim") << ' ' << channel.at("channel");
        EXPECT_EQ(channel.at("path").get<std::string>(), NameOf(item->kind));
        EXPECT_EQ(channel.at("keys").get<int>(), kfshost::KeyCount(*item->stream)) << item->path;
        ASSERT_NO_FATAL_FAILURE(CompareChannel(*item, channel, scene.worstTimeError, nearKeys));
    }
}

}  // namespace

// In the finest scale: all values, next to keys as well.
TEST_P(GltfValues, AreThoseComputedFromTheFormatInAFineScale)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const expected = LoadSharedJson(std::string("expected/gltf_") + GetParam() + ".json");
    std::string const file = SharedData(expected.at("file"));
    Scene const scene = kfshost::ImportGltf(file, ImportOptions{FinestScale(kfshost::ImportGltf(file))});
    CompareFile(expected, scene, true);
}

// In the chosen scale, where keys stand at the decimals or frames that their floats stand for.
TEST_P(GltfValues, AreThoseComputedFromTheFormatInTheChosenScale)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const expected = LoadSharedJson(std::string("expected/gltf_") + GetParam() + ".json");
    Scene const scene = kfshost::ImportGltf(SharedData(expected.at("file")));
    EXPECT_TRUE(scene.exactTimes);
    CompareFile(expected, scene, false);
}

INSTANTIATE_TEST_SUITE_P(AllFiles, GltfValues,
                         testing::Values("01_cs_morph", "01_cs_rotate", "01_cs_translate", "03_all_animations",
                                         "06_parent-inverse-anim", "Fox", "InfiniteSkinnedTentacle", "Med_CombatRanged",
                                         "MorphStressTest", "box_animated", "cesium_man", "interpolation_test",
                                         "magnum_animation-embedded", "rigged_simple"),
                         [](auto const& test) {
                             std::string name = test.param;
                             std::ranges::replace(name, '-', '_');
                             return name;
                         });

class GltfFiles : public HostTest {};

// What the file's own authors say about it, to the digits that they print.
TEST_F(GltfFiles, SplinesAnswerWhatTheirAuthorsPublished)
{
    SKIP_WITHOUT_SHARED_DATA();
    Scene const scene = kfshost::ImportGltf(SharedData("gltf/magnum_animation-embedded.gltf"));
    std::map<std::string, std::vector<double>> const published{
        {"TRS animation, splines/node4/translation", {1.04525, 0.357862, 0.540875}},
        {"TRS animation, splines/node5/scale", {0.118725, 0.8228, -2.711}},
        {"TRS animation, splines/node3/rotation", {-0.309862, 0.174831, 0.809747, 0.466615}},
    };
    int seen = 0;
    for (StreamItem const& item : scene.streams) {
        auto const values = published.find(item.path);
        if (values == published.end()) continue;
        ++seen;
        std::vector<double> row(item.components.size());
        kfshost::ReadAt(*item.stream, Rational(155, 100), row.data());
        double length = 1.0;
        if (item.kind == kfshost::StreamKind::Rotation)  // the store doesn't normalise, its caller does
            length = std::sqrt(row[0] * row[0] + row[1] * row[1] + row[2] * row[2] + row[3] * row[3]);
        for (std::size_t d = 0; d < row.size(); ++d)
            EXPECT_NEAR(values->second[d], row[d] / length, 1e-6) << item.path << ' ' << d;
    }
    EXPECT_EQ(3, seen);
}

TEST_F(GltfFiles, ChannelsWithoutKeysAreStreamsWithoutKeys)
{
    SKIP_WITHOUT_SHARED_DATA();
    Scene const scene = kfshost::ImportGltf(SharedData("gltf/magnum_animation-embedded.gltf"));
    ASSERT_EQ(9U, scene.streams.size());
    KFS_Stream const& empty = *scene.streams[1].stream;
    EXPECT_EQ(0, kfshost::KeyCount(empty));
    EXPECT_EQ(3, empty.GetDimension());
    double row[3] = {7, 7, 7};
    EXPECT_THROW(kfshost::ReadAt(empty, Rational(), row), std::runtime_error);
    EXPECT_EQ(7, row[0]);
    EXPECT_EQ(std::vector{KfsReport(36, "attempt to get a value from a time stream with no key values.")},
              reports_.Take());
}
