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

// A point of the file's cubic between two keys, by the format's own formula.
Place Hermite(float const* keys, double seconds, double u)
{
    Place place{};
    for (std::size_t d = 0; d < 3; ++d) {
        double const p0 = keys[3 + d], m0 = keys[6 + d] * seconds, m1 = keys[9 + d] * seconds, p1 = keys[12 + d];
        double const u2 = u * u, u3 = u2 * u;
        place[d] = (2 * u3 - 3 * u2 + 1) * p0 + (u3 - 2 * u2 + u) * m0 + (3 * u2 - 2 * u3) * p1 + (u3 - u2) * m1;
    }
    return place;
}

double DistanceToHermite(Place const& place, float const* keys, double seconds)
{
    double least = HUGE_VAL;
    for (int i = 0; i <= 20000; ++i) least = std::min(least, Distance(place, Hermite(keys, seconds, i / 20000.0)));
    return least;
}

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
        }
}

// A straight segment is gone through in equal steps, as the file's linear interpolation does.
TEST_F(Paths, StraightSegmentsAreEqualSteps)
{
    for (unsigned int seed = 1; seed <= 20; ++seed) {
        Scene const scene = Import("LINEAR", RandomNumbers(seed, 9));
        StreamItem const& item = scene.streams.front();
        auto const path = kfshost::MakePath(item);
        for (int segment = 0; segment < 2; ++segment) {
            double const length = Distance(At(*path, Rational(segment, 2)), At(*path, Rational(segment + 1, 2)));
            for (int i = 0; i < 12; ++i) {
                Rational const from(segment * 12 + i, 24);
                Place const place = At(*path, from);
                EXPECT_NEAR(0.0, Distance(At(*item.stream, from), place), 2e-4 * length) << seed << ' ' << i;
                EXPECT_NEAR(length / 12, Distance(place, At(*path, from + Rational(1, 24))), 4e-4 * length) << seed;
            }
        }
    }
}

// The timing is the speed graph's, but the point never leaves the file's cubic.
TEST_F(Paths, CurvedSegmentsStayOnTheFilesRoute)
{
    for (unsigned int seed = 1; seed <= 6; ++seed) {
        std::vector<float> const numbers = RandomNumbers(seed, 27);
        Scene const scene = Import("CUBICSPLINE", numbers);
        auto const path = kfshost::MakePath(scene.streams.front());
        for (int i = 1; i < 24; ++i) {
            float const* const keys = numbers.data() + (i < 12 ? 0 : 9);
            EXPECT_LT(DistanceToHermite(At(*path, Rational(i, 24)), keys, 0.5), 1e-3) << seed << ' ' << i;
        }
    }
}

// Next to a key the point goes as fast, and in the direction, that the file says.
TEST_F(Paths, CurvedSegmentsLeaveKeysWithTheFilesVelocity)
{
    std::vector<float> const numbers{0, 0, 0, 0, 0, 0, 3, 4, 0, 1, 0, 0, 2, 1, 1, 0, 2, 0, 0, 0, 2, 4, 1, 0, 0, 0, 0};
    Scene const scene = Import("CUBICSPLINE", numbers);
    auto const path = kfshost::MakePath(scene.streams.front());
    Place const next = At(*path, Rational(60, 120000));
    EXPECT_NEAR(3.0, next[0] * 2000, 0.03);
    EXPECT_NEAR(4.0, next[1] * 2000, 0.03);
    double in[3];
    double out[3];
    ASSERT_EQ(0, KFS_GetKeySpaceTangentsF(path.get(), 1, -1, in, out));
    EXPECT_NEAR(-1.0 / 6, in[0], 1e-15);  // the in tangent (1, 0, 0) times a sixth of a second, backwards
    EXPECT_NEAR(2.0 / 6, out[1], 1e-15);
}

TEST_F(Paths, OnlyPositionsOfTwoOrThreeComponentsAreOnes)
{
    StreamItem item;
    item.kind = kfshost::StreamKind::Translation;
    for (std::size_t components = 1; components <= 4; ++components) {
        item.components.resize(components);
        EXPECT_EQ(components == 2 || components == 3, kfshost::IsPosition(item)) << components;
    }
    item.kind = kfshost::StreamKind::Scale;
    item.components.resize(3);
    EXPECT_FALSE(kfshost::IsPosition(item));
}
