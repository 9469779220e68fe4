#include "host/paths.h"

#include "curves/spacetangents.h"
#include "host/import.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"
#include "tests/host/gltf_files.h"
#include "tests/host/hosttest.h"

#include <array>
#include <cmath>
#include <random>

using kfshost::Rational;
using kfshost::Scene;
using kfshost::StreamItem;

namespace {

using Place = std::array<double, 3>;

Place At(KFS_Stream const& stream, Rational const& time)
{
    Place place{};
    kfshost::ReadAt(stream, time, place.data());
    return place;
}

double Distance(Place const& a, Place const& b)
{
    return std::hypot(b[0] - a[0], b[1] - a[1], b[2] - a[2]);
}

class Paths : public HostTest {
protected:
    // One translation with keys at 0, 1/2 and 1 s. `numbers`: its values, with tangents for CUBICSPLINE.
    Scene Import(std::string const& interpolation, std::vector<float> const& numbers)
    {
        GltfFile file;
        file.data.resize(12);
        file.Add(numbers);
        file.document["animations"][0]["samplers"][0]["interpolation"] = interpolation;
        file.document["accessors"][1]["count"] = numbers.size() / 3;
        file.document["bufferViews"][1]["byteLength"] = numbers.size() * 4;
        file.document["buffers"][0]["byteLength"] = file.data.size();
        return kfshost::ImportGltf(folder_.Write("a.gltf", file.Text()));
    }

    ScratchFolder folder_;
};

std::vector<float> RandomNumbers(unsigned int seed, std::size_t count)
{
    std::mt19937 engine(seed);
    std::uniform_real_distribution<float> number(-3.0F, 3.0F);
    std::vector<float> numbers(count);
    for (float& each : numbers) each = number(engine);
    return numbers;
}

}  // namespace

// At keys and beyond, whatever lies between; and everywhere where nothing moves.
TEST_F(Paths, AgreeWithThePlainReadingAtKeysAndBeyond)
{
    for (std::string const interpolation : {"STEP", "LINEAR", "CUBICSPLINE"})
        for (unsigned int seed = 0; seed <= 20; ++seed) {
            SCOPED_TRACE(testing::Message() << interpolation << ", seed " << seed);
            bool const isCurved = interpolation == "CUBICSPLINE";
            std::vector<float> numbers = RandomNumbers(seed, isCurved ? 27 : 9);
            for (std::size_t i = 0; i < numbers.size() && seed == 0; ++i)
                numbers[i] = isCurved && i / 3 % 3 != 1 ? 0.0F : static_cast<float>(5 + i % 3);
            Scene const scene = Import(interpolation, numbers);
            StreamItem const& item = scene.streams.front();
            auto const path = kfshost::MakePath(item);
            ASSERT_EQ(3, kfshost::KeyCount(*path));
            if (seed == 0) kfshost::LetInnerKeysFloat(*path);
            for (int const half : {-10, 0, 1, 2, 14})
                EXPECT_EQ(At(*item.stream, Rational(half, 2)), At(*path, Rational(half, 2))) << half;
            for (int const units : {1, 59999, 60001, 119999})
                EXPECT_TRUE((interpolation != "STEP" && seed > 0) ||
                            At(*path, Rational(units / 60000, 2)) == At(*path, Rational(units, 120000)))
                    << units;
            // A straight segment is gone through in equal steps, as the file's linear interpolation does.
            for (int i = 0; i < 24 && interpolation == "LINEAR"; ++i) {
                double const length = Distance(At(*path, Rational(i / 12, 2)), At(*path, Rational(i / 12 + 1, 2)));
                double const error = Distance(At(*item.stream, Rational(i, 24)), At(*path, Rational(i, 24)));
                EXPECT_NEAR(0.0, error, 2e-4 * length) << i;
            }
        }
}

// The timing is the speed graph's, but the point never leaves the file's cubic, and leaves keys with the velocity that the
// file says.
TEST_F(Paths, CurvedSegmentsStayOnTheFilesRouteAndLeaveKeysAsItSays)
{
    for (unsigned int seed = 1; seed <= 6; ++seed) {
        std::vector<float> const numbers = RandomNumbers(seed, 27);
        Scene const scene = Import("CUBICSPLINE", numbers);
        auto const path = kfshost::MakePath(scene.streams.front());
        std::vector<Place> route;
        for (int units = 0; units <= 120000; units += 3)
            route.push_back(At(*scene.streams.front().stream, Rational(units, 120000)));
        for (int i = 1; i < 24; ++i) {
            Place const place = At(*path, Rational(i, 24));
            auto const distance = [&](Place const& each) { return Distance(place, each); };
            EXPECT_LT(distance(*std::ranges::min_element(route, {}, distance)), 1e-3) << seed << ' ' << i;
        }
        Place const start = At(*path, Rational()), next = At(*path, Rational(60, 120000));
        double in[3], out[3];
        ASSERT_EQ(0, KFS_GetKeySpaceTangentsF(path.get(), 1, -1, in, out));
        for (std::size_t d = 0; d < 3; ++d) {
            EXPECT_NEAR(static_cast<double>(numbers[6 + d]), (next[d] - start[d]) * 2000, 0.1);
            // A third of the segment's half second.
            EXPECT_NEAR(static_cast<double>(numbers[9 + d]) / -6, in[d], 1e-15);
            EXPECT_NEAR(static_cast<double>(numbers[15 + d]) / 6, out[d], 1e-15);
        }
    }
}

TEST_F(Paths, OnlyTranslationsOfTwoOrThreeComponentsAreOnes)
{
    for (std::size_t components = 1; components <= 4; ++components) {
        StreamItem item;
        item.components.resize(components);
        item.kind = kfshost::StreamKind::Translation;
        EXPECT_EQ(components == 2 || components == 3, kfshost::IsPosition(item)) << components;
    }
}
