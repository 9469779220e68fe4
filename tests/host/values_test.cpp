// Real files against values that were computed elsewhere: each importer's streams, and curves put together by hand.
#include "host/import.h"
#include "host/rotations.h"
#include "tests/host/hosttest.h"

#include <cmath>
#include <numbers>
#include <numeric>
#include <optional>

using kfshost::ImportOptions;
using kfshost::Rational;
using kfshost::Scene;
using kfshost::StreamItem;
using nlohmann::json;

namespace {

using Row = std::vector<double>;

Row ReadRow(KFS_Stream const& stream, Rational const& time)
{
    Row row(static_cast<std::size_t>(stream.GetDimension()));
    kfshost::ReadAt(stream, time, row.data());
    return row;
}

// Whether the curve comes within `tolerance` of a row's numbers at most `reach` units from a time: keys and samples are
// where the scale has a unit for them, curves may be next to vertical, and some times were printed with few digits.
void ExpectMet(KFS_Stream const& stream, Rational const& time, Row const& row, std::int64_t reach, double tolerance,
               std::size_t component = 0)
{
    unsigned int const scale = stream.GetTimeScale();
    std::int64_t const units = time.ToUnits(scale);
    Row low(row.size(), HUGE_VAL), high(row.size(), -HUGE_VAL);
    for (std::int64_t const at : {units - reach, units, units + reach}) {
        Row const found = ReadRow(stream, Rational(at, scale));
        ASSERT_LE(component + row.size(), found.size());
        for (std::size_t d = 0; d < row.size(); ++d) {
            low[d] = std::min(low[d], found[component + d]);
            high[d] = std::max(high[d], found[component + d]);
        }
    }
    for (std::size_t d = 0; d < row.size(); ++d)
        ASSERT_TRUE(low[d] - tolerance <= row[d] && row[d] <= high[d] + tolerance)
            << "component " << component + d << " at " << time.ToString() << " s: expected " << row[d] << ", found "
            << low[d] << " to " << high[d];
}

// Of numbers, or of rows of them.
void AddTo(Row& all, json const& numbers)
{
    if (numbers.is_number()) all.push_back(numbers.get<double>());
    for (json const& each : numbers.is_number() ? json::array() : numbers) AddTo(all, each);
}

double RangeOf(json const& numbers, Row all = {})
{
    AddTo(all, numbers);
    auto const [low, high] = std::ranges::minmax(all);
    return high > low ? high - low : std::max(std::abs(high), 1.0);
}

// The finest scale that holds the span: times lose next to nothing in it.
unsigned int FinestScale(double longest)
{
    return 1U << std::min(30, static_cast<int>(std::floor(std::log2((1 << 30) / std::max(longest, 0.1)))));
}

// ---- glTF

double Dot(Row const& a, Row const& b)
{
    return std::inner_product(a.begin(), a.end(), b.begin(), 0.0);
}

// Degrees between two rotations.
double AngleBetween(Row const& a, Row const& b)
{
    double const cosine = std::abs(Dot(a, b)) / std::sqrt(Dot(a, a) * Dot(b, b));
    return 2.0 * std::acos(std::min(cosine, 1.0)) * 180.0 / std::numbers::pi;
}

// A linear rotation is held against the arc, from which it is off by what the documented bound says for the keys around,
// and by no more. Whether `row` is the long way round between them, with the sign of one turned.
bool IsLongWay(KFS_Stream const& stream, Rational const& time, Row const& row, Row const& slerp, double rounding)
{
    int end = 0;
    while (end + 1 < kfshost::KeyCount(stream) && kfshost::KeyTime(stream, end) <= time) ++end;
    Rational const from = kfshost::KeyTime(stream, std::max(end - 1, 0)), to = kfshost::KeyTime(stream, end);
    double const share = from < to ? ((time - from) / (to - from)).ToDouble() : 0.0;
    Row const before = ReadRow(stream, from), after = ReadRow(stream, to);
    EXPECT_GE(Dot(before, after), 0.0) << "neighbours of opposite sign at " << time.ToString();
    // The lengths of keys, which are floats, and the angle's own rounding.
    EXPECT_LE(AngleBetween(ReadRow(stream, time), slerp),
              kfshost::ArcDeviationBound(AngleBetween(before, after)) + rounding * 360.0 * 120.0 + 1e-4)
        << " at " << time.ToString() << " s";
    double plus = 0.0, minus = 0.0;
    for (std::size_t d = 0; d < row.size(); ++d) {
        double const number = (1.0 - share) * before[d] - share * after[d];
        plus = std::max(plus, std::abs(number - row[d]));
        minus = std::max(minus, std::abs(number + row[d]));
    }
    return std::min(plus, minus) < 1e-6;
}

// `nearKeys`: whether the scale is fine enough to trust samples next to keys. A rotation's values are held up to their
// sign, and where a sign was turned between two keys only against the arc, not against the long way round.
void CompareChannel(StreamItem const& item, json const& channel, double keyRounding, bool nearKeys)
{
    SCOPED_TRACE(item.path);
    EXPECT_EQ(channel.at("path").get<std::string>(), NameOf(item.kind));
    EXPECT_EQ(channel.at("keys").get<int>(), kfshost::KeyCount(*item.stream));
    // Some curves barely move; a number near 1 is good to some 1e-16.
    double const tolerance = std::max(1e-9 * RangeOf(channel.at("v")), 1e-14);
    std::string const kinds = channel.at("kind");
    bool const isSigned = item.kind != kfshost::StreamKind::Rotation || channel.at("interp") == "CUBICSPLINE";
    for (std::size_t i = 0; i < kinds.size(); ++i) {
        if (kinds[i] == 'n' && !nearKeys) continue;
        Rational const time = TimeOf(channel.at("t")[i]);
        bool const isExact = channel.at("interp") == "STEP" || kinds[i] == 'o' || (kinds[i] == 'k' && nearKeys);
        double const rounding = isExact ? 0.0 : keyRounding + RoundingOf(time, item.stream->GetTimeScale());
        auto row = channel.at("v")[i].get<Row>();
        if (channel.contains("slerp") &&
            IsLongWay(*item.stream, time, row, channel.at("slerp")[i].get<Row>(), rounding))
            continue;
        double const sign = !isSigned && Dot(ReadRow(*item.stream, time), row) < 0.0 ? -1.0 : 1.0;
        for (double& number : row) number *= sign;
        ASSERT_EQ(item.components.size(), row.size());
        auto const reach = static_cast<std::int64_t>(std::ceil(rounding * item.stream->GetTimeScale()));
        ASSERT_NO_FATAL_FAILURE(ExpectMet(*item.stream, time, row, reach, isExact ? 0.0 : tolerance)) << kinds[i];
    }
}

class Values : public HostTest, public testing::WithParamInterface<char const*> {};

// In the finest scale all values, next to keys as well; and in the chosen scale, where keys stand at the decimals or
// frames that their floats stand for.
class GltfValues : public Values {};

TEST_P(GltfValues, AreThoseComputedFromTheFormat)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const expected = LoadSharedJson(std::string("expected/gltf_") + GetParam() + ".json");
    std::string const file = SharedData(expected.at("file"));
    double longest = 0.0;
    for (bool const nearKeys : {false, true}) {
        Scene const scene = kfshost::ImportGltf(file, ImportOptions{nearKeys ? FinestScale(longest) : 0});
        EXPECT_TRUE(nearKeys || scene.exactTimes);
        for (StreamItem const& item : scene.streams)
            if (int const keys = kfshost::KeyCount(*item.stream))
                longest = std::max(longest, kfshost::KeyTime(*item.stream, keys - 1).ToDouble());
        for (json const& channel : expected.at("channels")) {
            std::string const place = "animations[" + std::to_string(channel.at("anim").get<int>()) + "].channels[" +
                                      std::to_string(channel.at("channel").get<int>()) + ']';
            auto const item = std::ranges::find(scene.streams, place, &StreamItem::place);
            ASSERT_NE(scene.streams.end(), item) << place;
            ASSERT_NO_FATAL_FAILURE(CompareChannel(*item, channel, scene.worstTimeError, nearKeys));
        }
    }
}

INSTANTIATE_TEST_SUITE_P(AllFiles, GltfValues,
                         testing::Values("01_cs_morph", "01_cs_rotate", "01_cs_translate", "03_all_animations",
                                         "06_parent-inverse-anim", "Fox", "InfiniteSkinnedTentacle", "Med_CombatRanged",
                                         "MorphStressTest", "box_animated", "cesium_man", "interpolation_test",
                                         "magnum_animation-embedded", "rigged_simple"));

TEST_F(HostTest, ChannelsWithoutKeysAreStreamsWithoutKeys)
{
    SKIP_WITHOUT_SHARED_DATA();
    Scene const scene = kfshost::ImportGltf(SharedData("gltf/magnum_animation-embedded.gltf"));
    ASSERT_EQ(9U, scene.streams.size());
    KFS_Stream const& empty = *scene.streams[1].stream;
    EXPECT_TRUE(kfshost::KeyCount(empty) == 0 && empty.GetDimension() == 3);
    EXPECT_THROW(ReadRow(empty, Rational()), std::runtime_error);
    EXPECT_EQ(std::vector{KfsReport(36, "attempt to get a value from a time stream with no key values.")},
              reports_.Take());
}

// ---- BVH

class BvhValues : public Values {};

// A scale of 1/36000000 s holds the quarters of frames that most samples are at. The files' frame times are the fractions
// that their few digits are meant for: what is expected at a time of the digits' is found at the same share of a frame.
TEST_P(BvhValues, AreThoseOfTheFile)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const expected = LoadSharedJson(std::string("expected/bvh_") + GetParam() + ".json");
    Scene const scene = kfshost::ImportBvh(SharedData(expected.at("file")), ImportOptions{.timeScale = 36'000'000});
    EXPECT_TRUE(scene.exactTimes);
    Rational const written = *Rational::Parse(expected.at("frame_time_text").get<std::string>());
    Rational const meant = kfshost::KeyTime(*scene.streams.front().stream, 1);
    EXPECT_EQ(1, meant.Numerator());
    EXPECT_NEAR(written.ToDouble(), meant.ToDouble(), 1e-6);
    for (json const& channel : expected.at("channels")) {
        std::string const place = "joints[" + std::to_string(channel.at("joint_index").get<int>()) + ']';
        std::string const name = channel.at("channel"), kinds = channel.at("kind");
        auto const item = std::ranges::find_if(scene.streams, [&](StreamItem const& each) {
            return each.place == place && std::ranges::count(each.components, name) == 1;
        });
        ASSERT_NE(scene.streams.end(), item) << place << ' ' << name;
        SCOPED_TRACE(item->path);
        EXPECT_EQ(expected.at("frames").get<int>(), kfshost::KeyCount(*item->stream));
        auto const component = std::ranges::find(item->components, name) - item->components.begin();
        double const tolerance = 1e-9 * std::max(RangeOf({channel.at("min"), channel.at("max")}), 1e-3);
        for (std::size_t i = 0; i < kinds.size(); ++i) {
            bool const isExact = kinds[i] == 'k' || kinds[i] == 'o';
            ASSERT_NO_FATAL_FAILURE(ExpectMet(*item->stream, TimeOf(channel.at("t")[i]) / written * meant,
                                              {channel.at("v")[i].get<double>()}, isExact ? 0 : 1,
                                              isExact ? 0.0 : tolerance, static_cast<std::size_t>(component)));
        }
    }
}

INSTANTIATE_TEST_SUITE_P(BothFiles, BvhValues, testing::Values("cmu_01_01", "fair1_dab"));

// ---- Bezier curves put together by hand

// A key of a one-dimensional curve: speed and influence on both sides.
struct CurveKey {
    Rational time;
    double value = 0.0;
    KFS_Interp in = KFS_Interp_Linear, out = KFS_Interp_Linear;
    double inSpeed = 0.0, inInfluence = 0.0, outSpeed = 0.0, outInfluence = 0.0;
};

std::unique_ptr<KFS_Stream> Build(std::vector<CurveKey> const& keys, unsigned int scale)
{
    kfshost::StreamBuilder builder(1, scale, "curve");
    for (CurveKey const& key : keys) builder.Append(key.time.ToUnits(scale), &key.value, key.in, key.out);
    for (int i = 0; CurveKey const& key : keys)
        builder.SetHandles(i++, {&key.inSpeed, &key.inInfluence, &key.outSpeed, &key.outInfluence});
    return builder.Take();
}

double LongestOf(std::vector<CurveKey> const& keys)
{
    return std::max(std::abs(keys.front().time.ToDouble()), std::abs(keys.back().time.ToDouble()));
}

// A scale in which all of these times are whole numbers, if there is one.
std::optional<unsigned int> CommonScale(json const& times)
{
    std::int64_t scale = 1;
    double longest = 1e-9;
    for (json const& pair : times) {
        scale = std::lcm(scale, TimeOf(pair).Denominator());
        longest = std::max(longest, std::abs(TimeOf(pair).ToDouble()));
        if (scale * longest > INT_MAX || scale > UINT_MAX) return std::nullopt;
    }
    return static_cast<unsigned int>(scale);
}

KFS_Interp CodeOf(std::string const& name)
{
    return name == "hold" || name == "held" || name == "Held" ? KFS_Interp_Hold
           : name == "linear" || name == "Linear"             ? KFS_Interp_Linear
                                                              : KFS_Interp_Spline;
}

class CurveValues : public Values {};

TEST_P(CurveValues, OfHandAuthoredCurvesAreMet)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const file = LoadSharedJson(GetParam()), none = {{"speed", 0.0}, {"influence", 0.0}};
    ASSERT_FALSE(file.at("curves").empty());
    for (json const& curve : file.at("curves")) {
        SCOPED_TRACE(curve.at("id"));
        std::vector<CurveKey> keys;
        Row values;
        for (json const& key : curve.at("keys")) {
            json const in = key.value("in", none), out = key.value("out", none);
            keys.push_back({TimeOf(key.at("t")), key.at("v"), keys.empty() ? KFS_Interp_Linear : keys.back().out,
                            CodeOf(key.at("interp")), in.at("speed"), in.at("influence"), out.at("speed"),
                            out.at("influence")});
            values.push_back(key.at("v"));
        }
        auto const exactScale = CommonScale(curve.at("t"));
        auto const stream = Build(keys, exactScale.value_or(FinestScale(LongestOf(keys))));
        double const tolerance = 1e-9 * RangeOf(curve.at("v"), values);
        std::string const kinds = curve.at("kind");
        for (std::size_t i = 0; i < kinds.size(); ++i) {
            bool const isExact = kinds[i] == 'k' || kinds[i] == 'o';
            ASSERT_NO_FATAL_FAILURE(ExpectMet(*stream, TimeOf(curve.at("t")[i]), {curve.at("v")[i].get<double>()},
                                              isExact || exactScale ? 0 : 1, isExact ? 0.0 : tolerance));
        }
    }
}

INSTANTIATE_TEST_SUITE_P(AllFiles, CurveValues,
                         testing::Values("curves/robot_expressive.json", "curves/red_robot.json",
                                         "curves/interpolation_sampled.json", "expected/curves_ButtonPress.anim.json",
                                         "expected/curves_CanvasDialogShow.anim.json",
                                         "expected/curves_HandMenuAnimation.anim.json",
                                         "expected/curves_large_world_coordinates_test.tscn.json",
                                         "expected/curves_vn_textbox_layer.tscn.json"));

Rational Decimal(double seconds)
{
    return {std::llround(seconds * 1e12), 1'000'000'000'000};
}

std::vector<CurveKey> KnotsOf(json const& spline)
{
    std::vector<CurveKey> keys;
    for (json const& knot : spline.at("knots")) keys.push_back({Decimal(knot.at("time")), knot.at("value")});
    for (std::size_t i = 0; i + 1 < keys.size(); ++i) {
        json const& segment = spline.at("segments")[i];
        keys[i].out = keys[i + 1].in = CodeOf(segment.value("type", "Curve"));
        if (keys[i].out != KFS_Interp_Spline) continue;
        segment.at("out_speed").get_to(keys[i].outSpeed);
        segment.at("out_influence").get_to(keys[i].outInfluence);
        segment.at("in_speed").get_to(keys[i + 1].inSpeed);
        segment.at("in_influence").get_to(keys[i + 1].inInfluence);
    }
    return keys;
}

// Most of the programs' own samples are printed with six digits, times too, and are good to about as much: a value must be
// met within two millionths of its time. The odd shapes, vertical ones among them, are held against exact values. Plain
// streams hold influences up to 1.
TEST_F(HostTest, SampledSplinesAreMet)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const file = LoadSharedJson("ts/ts_splines.json");
    for (bool const isOdd : {false, true}) {
        int compared = 0;
        for (json const& spline : file.at(isOdd ? "museum" : "baselines")) {
            if (!spline.at("one_to_one_inside") || !spline.at("influence_le_1") || (isOdd && !spline.contains("t")))
                continue;
            ++compared;
            SCOPED_TRACE(spline.at("name"));
            std::vector<CurveKey> const keys = KnotsOf(spline);
            bool const isPrinted = !isOdd && spline.at("digits").get<int>() < 17;
            auto const stream = Build(keys, isPrinted ? 10'000'000 : FinestScale(LongestOf(keys)));
            auto const suspects = spline.value("suspect_samples", std::vector<std::size_t>());
            double const tolerance = isPrinted ? 2e-6 : isOdd ? 1e-9 * RangeOf(spline.at("v")) : 1e-9;
            for (std::size_t i = 0; i < spline.at(isOdd ? "t" : "samples").size(); ++i) {
                Rational const time = isOdd ? TimeOf(spline.at("t")[i]) : Decimal(spline.at("samples")[i][0]);
                json const& value = isOdd ? spline.at("v")[i] : spline.at("samples")[i][1];
                bool const isInside = keys.front().time <= time && time <= keys.back().time;
                if (!isInside || std::ranges::find(suspects, i) != suspects.end()) continue;
                ASSERT_NO_FATAL_FAILURE(
                    ExpectMet(*stream, time, {value.get<double>()}, isPrinted ? 20 : 2 - isOdd, tolerance));
            }
        }
        EXPECT_GE(compared, isOdd ? 4 : 20);
    }
}

}  // namespace
