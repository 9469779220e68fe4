#include "frame/services/chunkfile.h"
#include "fuzz/treekinds.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/projectfile.h"
#include "host/session.h"
#include "keystore/evaluate.h"
#include "tests/hostile/samples.h"
#include "tests/support/reports.h"

#include <gtest/gtest.h>

#include <climits>
#include <functional>
#include <span>

// Files cut anywhere and with any byte changed: a project or a scene that can be read and saved, or one line that says
// why not.

using kfshost::Scene;
using kfshost::StreamItem;

namespace {

// What a load may keep: this much, and so many bytes for each of the file's. A group in a file takes some 60 bytes, and
// in memory it has a slot for each kind of leaf.
constexpr std::int64_t KeptBytes = 65536;
constexpr std::int64_t KeptPerByte = 32;

std::span<unsigned char const> Span(std::string const& bytes)
{
    return {reinterpret_cast<unsigned char const*>(bytes.data()), bytes.size()};
}

void ReadAll(Scene const& scene)
{
    for (StreamItem const& item : scene.streams) {
        std::vector<double> value(static_cast<std::size_t>(item.stream->GetDimension()));
        for (int const time : {INT_MIN, -1, 0, 5, 12, 13, 30, INT_MAX}) {
            T_Time const at{time, item.stream->GetTimeScale()};
            static_cast<void>(KFS_GetValueFPlus(item.stream.get(), &at, 0, value.data(), nullptr, nullptr));
        }
    }
}

class EveryByte : public testing::Test {
protected:
    void TearDown() override { reports_.Take(); }

    using IsTaken = std::function<bool(std::string const&)>;

    // Whether the file was taken. `load` throws `Refusal` for one that isn't.
    template <class Refusal>
    static IsTaken Taking(std::function<Scene(std::string const&)> const& load)
    {
        return [load](std::string const& bytes) {
            std::int64_t const before = Q_MemoryLive(nullptr).bytes;
            try {
                Scene const scene = load(bytes);
                EXPECT_LT(Q_MemoryLive(nullptr).bytes - before,
                          KeptBytes + KeptPerByte * static_cast<std::int64_t>(bytes.size()));
                ReadAll(scene);
                return true;
            } catch (Refusal const& refusal) {
                EXPECT_EQ(std::string::npos, std::string(refusal.what()).find_first_of("\n\r\x1B")) << refusal.what();
                return false;
            }
        };
    }

    // Cut anywhere, a sample is refused but for so many lengths. Changed in two ways at each byte it is taken here and
    // there, where a name or a value may be another, but not where a length may not. Finds of fuzzing among the samples
    // aren't taken to begin with.
    static void ExpectSurvived(std::string const& target, int least, int cutsTaken, IsTaken const& load)
    {
        // A block of its own size, so that the sanitizer sees a read behind it.
        auto const isTaken = [&](std::string const& bytes) { return load(std::string(bytes.data(), bytes.size())); };
        int sound = 0;
        for (auto const& [name, bytes] : Samples(target)) {
            SCOPED_TRACE(name);
            if (!isTaken(bytes)) continue;
            ++sound;
            int whole = 0, taken = 0;
            for (std::size_t size = 0; size < bytes.size(); ++size) whole += isTaken(bytes.substr(0, size));
            EXPECT_GE(cutsTaken, whole);
            EXPECT_FALSE(cutsTaken == 0 && isTaken(bytes + '\0'));
            for (std::size_t at = 0; at < bytes.size(); ++at)
                for (int const mask : {0x01, 0xFF}) {
                    SCOPED_TRACE(testing::Message() << "byte " << at << " mask " << mask);
                    std::string changed = bytes;
                    changed[at] = static_cast<char>(changed[at] ^ mask);
                    taken += isTaken(changed);
                }
            EXPECT_TRUE(0 < taken && taken < 2 * static_cast<int>(bytes.size())) << taken;
        }
        EXPECT_LE(least, sound);
    }

    kfshost::Session session_;
    ReportRecorder reports_;
};

TEST_F(EveryByte, ProjectsMayBeCutAndChangedAnywhere)
{
    ExpectSurvived("project", 13, 0, Taking<kfshost::ProjectError>([](std::string const& bytes) {
                       auto tree = kfshost::LoadProjectFromMemory(Span(bytes), "sample");
                       auto const saved = kfshost::SaveProjectToMemory(*tree, "saved");
                       auto const again = kfshost::LoadProjectFromMemory(saved, "saved");
                       EXPECT_EQ(saved, kfshost::SaveProjectToMemory(*again, "again"));
                       return kfshost::TakeScene(std::move(tree));
                   }));
}

// A tree of kinds that files can't change, read as a host's root would read it.
TEST_F(EveryByte, TreesMayBeCutAndChangedAnywhere)
{
    fuzzkinds::TreeKinds const kinds;
    ExpectSurvived("tree", 1, 0, [](std::string const& bytes) {
        auto const root = fuzzkinds::TreeKinds::MakeRoot();
        CKF_File file;
        return file.Open(Span(bytes)) == 0 && KFSp_Boundary([&] { root->Read(&file, nullptr); }) == 0;
    });
}

// But for the last digit and the last line's end nothing can be missing.
TEST_F(EveryByte, ImportsMayBeCutAndChangedAnywhere)
{
    ExpectSurvived("gltf", 4, 2, Taking<kfshost::ImportError>([](std::string const& bytes) {
                       return kfshost::ImportGltfFromMemory(bytes, "nowhere/a.gltf");
                   }));
    ExpectSurvived("bvh", 1, 2, Taking<kfshost::ImportError>([](std::string const& bytes) {
                       return kfshost::ImportBvhFromMemory(bytes, "a.bvh");
                   }));
}

}  // namespace
