#include "tests/host/hosttest.h"

#include <cmath>
#include <numeric>
#include <optional>

using kfshost::Rational;
using kfshost::StreamBuilder;
using nlohmann::json;

namespace {

// One side of a key of a one-dimensional curve.
struct Side {
    double speed = 0.0;
    double influence = 0.0;
};

struct CurveKey {
    Rational time;
    double value;
    KFS_Interp in;
    KFS_Interp out;
    Side inSide;
    Side outSide;
};

std::unique_ptr<KFS_Stream> Build(std::vector<CurveKey> const& keys, unsigned int scale)
{
    StreamBuilder builder(1, scale, "curve");
    for (CurveKey const& key : keys) builder.Append(key.time.ToUnits(scale), &key.value, key.in, key.out);
    for (std::size_t i = 0; i < keys.size(); ++i) {
        CurveKey const& key = keys[i];
        builder.SetHandles(static_cast<int>(i),
                           {&key.inSide.speed, &key.inSide.influence, &key.outSide.speed, &key.outSide.influence});
    }
    return builder.Take();
}

double RangeOf(std::vector<CurveKey> const& keys, std::vector<double> values)
{
    for (CurveKey const& key : keys) values.push_back(key.value);
    auto const [low, high] = std::ranges::minmax(values);
    return high > low ? high - low : std::max(std::abs(high), 1.0);
}

// A scale in which all of these times are whole numbers, if there is one.
std::optional<unsigned int> CommonScale(std::vector<Rational> const& times)
{
    std::int64_t scale = 1;
    double longest = 0.0;
    for (Rational const& time : times) {
        scale = std::lcm(scale, time.Denominator());
        longest = std::max(longest, std::abs(time.ToDouble()));
        if (scale * std::max(longest, 1e-9) > INT_MAX || scale > UINT_MAX) return std::nullopt;
    }
    return static_cast<unsigned int>(scale);
}

unsigned int FinestScale(std::vector<CurveKey> const& keys)
{
    double const longest = std::max(std::abs(keys.front().time.ToDouble()), std::abs(keys.back().time.ToDouble()));
    return 1U << std::min(30, static_cast<int>(std::floor(std::log2(INT_MAX / (2.0 * std::max(longest, 0.5))))));
}

KFS_Interp CodeOf(std::string const& name)
{
    return name == "hold" || name == "held" || name == "Held" ? KFS_Interp_Hold
           : name == "linear" || name == "Linear"             ? KFS_Interp_Linear
                                                              : KFS_Interp_Spline;
}

Side SideOf(json const& key, char const* name)
{
    auto const side = key.find(name);
    return side == key.end() ? Side{} : Side{side->at("speed").get<double>(), side->at("influence").get<double>()};
}

std::vector<CurveKey> KeysOf(json const& curve)
{
    std::vector<CurveKey> keys;
    KFS_Interp before = KFS_Interp_Linear;
    for (json const& key : curve.at("keys")) {
        KFS_Interp const after = CodeOf(key.at("interp"));
        keys.push_back(
            {TimeOf(key.at("t")), key.at("v").get<double>(), before, after, SideOf(key, "in"), SideOf(key, "out")});
        before = after;
    }
    return keys;
}

std::vector<Rational> TimesOf(json const& list)
{
    std::vector<Rational> times;
    for (json const& time : list) times.push_back(TimeOf(time));
    return times;
}

// Whether the curve comes within `tolerance` of `value` at most `reach` units from a time: how a curve is compared
// where it is next to vertical, or where the time was printed with few digits.
bool Reaches(KFS_Stream const& stream, Rational const& time, std::int64_t reach, double value, double tolerance)
{
    double low = HUGE_VAL;
    double high = -HUGE_VAL;
    std::int64_t const units = time.ToUnits(stream.GetTimeScale());
    for (std::int64_t const at : {units - reach, units, units + reach}) {
        double const found = ReadOne(stream, Rational(at, stream.GetTimeScale()));
        low = std::min(low, found);
        high = std::max(high, found);
    }
    return low - tolerance <= value && value <= high + tolerance;
}

class HandAuthoredCurves : public HostTest, public testing::WithParamInterface<char const*> {};

void CompareCurve(json const& curve)
{
    std::vector<CurveKey> const keys = KeysOf(curve);
    std::vector<Rational> const times = TimesOf(curve.at("t"));
    auto const values = curve.at("v").get<std::vector<double>>();
    std::string const kinds = curve.at("kind");
    auto const exactScale = CommonScale(times);
    auto const stream = Build(keys, exactScale.value_or(FinestScale(keys)));
    double const range = RangeOf(keys, values);
    for (std::size_t i = 0; i < times.size(); ++i) {
        SCOPED_TRACE(testing::Message() << curve.at("id") << " at " << times[i].ToString() << " s, kind " << kinds[i]);
        bool const isExact = kinds[i] == 'k' || kinds[i] == 'o';
        if (isExact || exactScale)
            ASSERT_NEAR(values[i], ReadOne(*stream, times[i]), isExact ? 0.0 : 1e-9 * range);
        else
            ASSERT_TRUE(Reaches(*stream, times[i], 1, values[i], 1e-9 * range));
    }
}

}  // namespace

TEST_P(HandAuthoredCurves, AreMetEverywhere)
{
    SKIP_WITHOUT_SHARED_DATA();
    json const file = LoadSharedJson(GetParam());
    ASSERT_FALSE(file.at("curves").empty());
    for (json const& curve : file.at("curves")) ASSERT_NO_FATAL_FAILURE(CompareCurve(curve));
}

INSTANTIATE_TEST_SUITE_P(AllFiles, HandAuthoredCurves,
                         testing::Values("curves/robot_expressive.json", "curves/red_robot.json",
                                         "curves/interpolation_sampled.json", "expected/curves_ButtonPress.anim.json",
                                         "expected/curves_CanvasDialogShow.anim.json",
                                         "expected/curves_HandMenuAnimation.anim.json",
                                         "expected/curves_large_world_coordinates_test.tscn.json",
                                         "expected/curves_vn_textbox_layer.tscn.json"));

namespace {

class SampledSplines : public HostTest {
protected:
    void SetUp() override
    {
        SKIP_WITHOUT_SHARED_DATA();
        file_ = LoadSharedJson("ts/ts_splines.json");
    }

    json file_;
};

// Plain streams hold influences up to 1.
bool CanBeHeld(json const& spline)
{
    return spline.at("one_to_one_inside").get<bool>() && spline.at("influence_le_1").get<bool>();
}

Rational Decimal(double seconds)
{
    return {std::llround(seconds * 1e12), 1'000'000'000'000};
}

std::vector<CurveKey> KnotsOf(json const& spline)
{
    std::vector<CurveKey> keys;
    for (json const& knot : spline.at("knots"))
        keys.push_back({Decimal(knot.at("time")), knot.at("value"), KFS_Interp_Linear, KFS_Interp_Linear, {}, {}});
    for (std::size_t i = 0; i + 1 < keys.size(); ++i) {
        json const& segment = spline.at("segments")[i];
        KFS_Interp const code = segment.contains("type") ? CodeOf(segment.at("type")) : KFS_Interp_Spline;
        keys[i].out = keys[i + 1].in = code;
        if (code == KFS_Interp_Spline) {
            keys[i].outSide = {segment.at("out_speed"), segment.at("out_influence")};
            keys[i + 1].inSide = {segment.at("in_speed"), segment.at("in_influence")};
        }
    }
    return keys;
}

bool IsInside(std::vector<CurveKey> const& keys, Rational const& time)
{
    return keys.front().time <= time && time <= keys.back().time;
}

}  // namespace

// Most of the programs' own samples are printed with six digits, times too, and are good to about as much: a value must be
// met within two millionths of its time. The odd shapes, vertical ones among them, are held against exact values.
TEST_F(SampledSplines, AreMet)
{
    for (bool const isOdd : {false, true}) {
        int compared = 0;
        for (json const& spline : file_.at(isOdd ? "museum" : "baselines")) {
            if (!CanBeHeld(spline) || (isOdd && !spline.contains("t"))) continue;
            ++compared;
            std::vector<CurveKey> const keys = KnotsOf(spline);
            bool const isPrinted = !isOdd && spline.at("digits").get<int>() < 17;
            auto const stream = Build(keys, isPrinted ? 10'000'000 : FinestScale(keys));
            auto const suspects = spline.value("suspect_samples", std::vector<std::size_t>());
            std::vector<Rational> times = isOdd ? TimesOf(spline.at("t")) : std::vector<Rational>();
            std::vector<double> values = isOdd ? spline.at("v").get<std::vector<double>>() : std::vector<double>();
            for (json const& sample : isOdd ? json::array() : spline.at("samples")) {
                times.push_back(Decimal(sample[0]));
                values.push_back(sample[1]);
            }
            double const tolerance = isPrinted ? 2e-6 : isOdd ? 1e-9 * RangeOf(keys, values) : 1e-9;
            for (std::size_t i = 0; i < times.size(); ++i) {
                if (std::ranges::find(suspects, i) != suspects.end() || !IsInside(keys, times[i])) continue;
                ASSERT_TRUE(Reaches(*stream, times[i],
                                    isPrinted ? 20
                                    : isOdd   ? 1
                                              : 2,
                                    values[i], tolerance))
                    << spline.at("name") << " at " << times[i].ToString() << ": " << values[i] << " against "
                    << ReadOne(*stream, times[i]);
            }
        }
        EXPECT_GE(compared, isOdd ? 4 : 20);
    }
}
