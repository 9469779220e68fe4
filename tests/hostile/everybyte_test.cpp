#include "frame/services/chunkfile.h"
#include "fuzz/treekinds.h"
#include "host/import.h"
#include "host/import_error.h"
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

using Import = std::function<Scene(std::string const&)>;

class EveryByte : public testing::Test {
protected:
    void TearDown() override { reports_.Take(); }

    // Whether the file was taken. `load` throws `Refusal` for one that isn't.
    template <class Refusal>
    bool IsTaken(std::string const& bytes, Import const& load)
    {
        std::int64_t const before = Q_MemoryLive(nullptr).bytes;
        try {
            // A block of its own size, so that the sanitizer sees a read behind it.
            Scene const scene = load(std::string(bytes.data(), bytes.size()));
            EXPECT_LT(Q_MemoryLive(nullptr).bytes - before,
                      KeptBytes + KeptPerByte * static_cast<std::int64_t>(bytes.size()));
            ReadAll(scene);
            return true;
        } catch (Refusal const& refusal) {
            EXPECT_EQ(std::string::npos, std::string(refusal.what()).find_first_of("\n\r\x1B")) << refusal.what();
            return false;
        }
    }

    static Scene Load(std::string const& bytes)
    {
        auto tree = kfshost::LoadProjectFromMemory(Span(bytes), "sample");
        std::vector<unsigned char> const saved = kfshost::SaveProjectToMemory(*tree, "saved");
        EXPECT_EQ(saved, kfshost::SaveProjectToMemory(*kfshost::LoadProjectFromMemory(saved, "saved"), "again"));
        return kfshost::TakeScene(std::move(tree));
    }

    kfshost::Session session_;
    ReportRecorder reports_;
};

// How many of a sample's changed files are taken. Each byte is changed in two ways.
int CountTaken(std::string const& sample, std::function<bool(std::string const&)> const& isTaken)
{
    int taken = 0;
    for (std::size_t at = 0; at < sample.size(); ++at) {
        for (int const mask : {0x01, 0xFF}) {
            SCOPED_TRACE(testing::Message() << "byte " << at << " mask " << mask);
            std::string changed = sample;
            changed[at] = static_cast<char>(changed[at] ^ mask);
            taken += isTaken(changed) ? 1 : 0;
        }
    }
    return taken;
}

TEST_F(EveryByte, ProjectsThatAreCutAreRefused)
{
    for (Sample const& sample : ProjectSamples()) {
        SCOPED_TRACE(sample.name);
        auto const isTaken = [&](std::string const& bytes) { return IsTaken<kfshost::ProjectError>(bytes, Load); };
        EXPECT_TRUE(isTaken(sample.bytes));
        for (std::size_t size = 0; size < sample.bytes.size(); ++size)
            EXPECT_FALSE(isTaken(sample.bytes.substr(0, size))) << size << " bytes";
        EXPECT_FALSE(isTaken(sample.bytes + '\0'));
    }
}

TEST_F(EveryByte, ProjectsMayBeChangedAnywhere)
{
    for (Sample const& sample : ProjectSamples()) {
        SCOPED_TRACE(sample.name);
        int const taken = CountTaken(
            sample.bytes, [&](std::string const& bytes) { return IsTaken<kfshost::ProjectError>(bytes, Load); });
        EXPECT_LT(0, taken) << "a name or a value may be another";
        EXPECT_GT(2 * static_cast<int>(sample.bytes.size()), taken) << "a length may not";
    }
}

// A tree of kinds that files can't change, read as a host's root would read it.
TEST_F(EveryByte, TreesMayBeCutAndChangedAnywhere)
{
    fuzzkinds::TreeKinds const kinds;
    auto const isTaken = [](std::string const& bytes) {
        std::string const own(bytes.data(), bytes.size());
        auto const root = fuzzkinds::TreeKinds::MakeRoot();
        CKF_File file;
        return file.Open(Span(own)) == 0 && KFSp_Boundary([&] { root->Read(&file, nullptr); }) == 0;
    };
    for (Sample const& sample : TreeSamples()) {
        EXPECT_TRUE(isTaken(sample.bytes));
        for (std::size_t size = 0; size < sample.bytes.size(); ++size)
            EXPECT_FALSE(isTaken(sample.bytes.substr(0, size))) << size << " bytes";
        int const taken = CountTaken(sample.bytes, isTaken);
        EXPECT_LT(0, taken);
        EXPECT_GT(2 * static_cast<int>(sample.bytes.size()), taken);
    }
}

TEST_F(EveryByte, ImportsMayBeCutAndChangedAnywhere)
{
    auto const gltf = [](std::string const& bytes) { return kfshost::ImportGltfFromMemory(bytes, "nowhere/a.gltf"); };
    auto const bvh = [](std::string const& bytes) { return kfshost::ImportBvhFromMemory(bytes, "a.bvh"); };
    for (bool const isGltf : {true, false}) {
        Import const import = isGltf ? Import(gltf) : Import(bvh);
        for (Sample const& sample : isGltf ? GltfSamples() : BvhSamples()) {
            SCOPED_TRACE(sample.name);
            auto const isTaken = [&](std::string const& bytes) { return IsTaken<kfshost::ImportError>(bytes, import); };
            EXPECT_TRUE(isTaken(sample.bytes));
            int whole = 0;
            for (std::size_t size = 0; size < sample.bytes.size(); ++size)
                whole += isTaken(sample.bytes.substr(0, size)) ? 1 : 0;
            EXPECT_GE(2, whole) << "but for the last digit and the last line's end nothing can be missing";
            EXPECT_LT(0, CountTaken(sample.bytes, isTaken));
        }
    }
}

}  // namespace
