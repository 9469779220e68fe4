#include "host/import.h"
#include "tests/host/hosttest.h"

#include <cmath>

using kfshost::ImportOptions;
using kfshost::Rational;
using kfshost::Scene;
using kfshost::StreamItem;
using nlohmann::json;

namespace {

class BvhValues : public HostTest, public testing::WithParamInterface<char const*> {};

// The stream and the component that hold a channel of the file.
struct Found {
    StreamItem const* item = nullptr;
    std::size_t component = 0;
};

Found FindChannel(Scene const& scene, json const& channel)
{
    std::string const place = "joints[" + std::to_string(channel.at("joint_index").get<int>()) + ']';
    for (StreamItem const& item : scene.streams) {
        auto const name = std::ranges::find(item.components, channel.at("channel").get<std::string>());
        if (item.place == place && name != item.components.end())
            return {&item, static_cast<std::size_t>(name - item.components.begin())};
    }
    return {};
}

double SlopeAround(json const& channel, double frameTime)
{
    return (channel.at("max").get<double>() - channel.at("min").get<double>()) / frameTime;
}

}  // namespace

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
    double const frameTime = meant.ToDouble();
    for (json const& channel : expected.at("channels")) {
        Found const found = FindChannel(scene, channel);
        ASSERT_NE(nullptr, found.item) << channel.at("joint") << ' ' << channel.at("channel");
        EXPECT_EQ(expected.at("frames").get<int>(), kfshost::KeyCount(*found.item->stream));
        double const range = std::max(channel.at("max").get<double>() - channel.at("min").get<double>(), 1e-3);
        std::string const kinds = channel.at("kind");
        for (std::size_t i = 0; i < kinds.size(); ++i) {
            Rational const time = TimeOf(channel.at("t")[i]) / written * meant;
            double const rounding = RoundingOf(time, scene.timeScale);
            double const tolerance =
                kinds[i] == 'k' || kinds[i] == 'o' ? 0.0 : 1e-9 * range + rounding * SlopeAround(channel, frameTime);
            ASSERT_NEAR(channel.at("v")[i].get<double>(), ReadOne(*found.item->stream, time, found.component),
                        tolerance)
                << found.item->path << ' ' << channel.at("channel") << " at " << time.ToString() << " s";
        }
    }
}

INSTANTIATE_TEST_SUITE_P(BothFiles, BvhValues, testing::Values("cmu_01_01", "fair1_dab"));
