#include "host/projectfile.h"

#include "frame/services/chunkfile.h"
#include "host/import.h"
#include "host/paths.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"
#include "tests/host/hosttest.h"
#include "tests/support/places.h"

#include <bit>
#include <cerrno>
#include <iterator>
#include <map>
#include <utility>

using kfshost::Scene;
using kfshost::StreamItem;

namespace {

std::string const Sample = kfstest::SamplesFolder() / "bouncing_ball.gltf";

std::map<std::string, StreamItem const*> ByPath(Scene const& scene)
{
    std::map<std::string, StreamItem const*> items;
    for (StreamItem const& item : scene.streams) EXPECT_TRUE(items.emplace(item.path, &item).second) << item.path;
    return items;
}

// All keys, and the values at a number of times from before the first to behind the last key, bit for bit.
void ExpectSameStream(KFS_Stream const& expected, KFS_Stream const& found, std::string const& path)
{
    SCOPED_TRACE(path);
    ASSERT_EQ(expected.GetDimension(), found.GetDimension());
    ASSERT_EQ(expected.GetTimeScale(), found.GetTimeScale());
    ASSERT_EQ(expected.GetKeyCount(), found.GetKeyCount());
    auto const dimension = static_cast<std::size_t>(expected.GetDimension());
    std::vector<double> before(dimension);
    std::vector<double> after(dimension);
    for (int i = 0; i < expected.GetKeyCount(); ++i) {
        ASSERT_EQ(kfshost::KeyTime(expected, i), kfshost::KeyTime(found, i));
        char inBefore = 0, outBefore = 0, inAfter = 0, outAfter = 0;
        ASSERT_EQ(0, KFS_GetKeyF(&expected, i, before.data(), &inBefore, &outBefore));
        ASSERT_EQ(0, KFS_GetKeyF(&found, i, after.data(), &inAfter, &outAfter));
        ASSERT_EQ(before, after);
        ASSERT_EQ(inBefore, inAfter);
        ASSERT_EQ(outBefore, outAfter);
    }
    if (expected.GetKeyCount() == 0) return;
    constexpr int steps = 61;  // doesn't divide what keys are placed by
    kfshost::Rational const first = kfshost::KeyTime(expected, 0) - kfshost::Rational(1, 10);
    kfshost::Rational const last = kfshost::KeyTime(expected, expected.GetKeyCount() - 1) + kfshost::Rational(1, 10);
    for (int step = 0; step <= steps; ++step) {
        kfshost::Rational const time = first + (last - first) * kfshost::Rational(step, steps);
        kfshost::ReadAt(expected, time, before.data());
        kfshost::ReadAt(found, time, after.data());
        for (std::size_t i = 0; i < dimension; ++i) {
            ASSERT_EQ(std::bit_cast<std::uint64_t>(before[i]), std::bit_cast<std::uint64_t>(after[i]))
                << "component " << i << " at " << time.ToString();
        }
    }
}

void ExpectSameScene(Scene const& expected, Scene const& found)
{
    EXPECT_EQ(expected.name, found.name);
    EXPECT_EQ(expected.timeScale, found.timeScale);
    EXPECT_EQ(expected.exactTimes, found.exactTimes);
    EXPECT_EQ(expected.worstTimeError, found.worstTimeError);
    auto const before = ByPath(expected);
    auto const after = ByPath(found);
    ASSERT_EQ(before.size(), after.size());
    for (auto const& [path, item] : before) {
        ASSERT_TRUE(after.contains(path)) << path;
        StreamItem const& other = *after.at(path);
        EXPECT_EQ(item->animation, other.animation);
        EXPECT_EQ(item->node, other.node);
        EXPECT_EQ(item->kind, other.kind);
        EXPECT_EQ(item->interpolation, other.interpolation) << path;
        EXPECT_EQ(item->components, other.components) << path;
        ExpectSameStream(*item->stream, *other.stream, path);
    }
}

// A linear stream of as many components as there are values, with two keys.
StreamItem Item(std::string const& node, kfshost::StreamKind kind, std::vector<double> const& value)
{
    StreamItem item;
    item.animation = "walk";
    item.node = node;
    item.kind = kind;
    item.path = kfshost::PathOf(item);
    kfshost::StreamBuilder builder(static_cast<int>(value.size()), 24, item.path);
    builder.Append(0, value.data(), KFS_Interp_Linear, KFS_Interp_Linear);
    std::vector<double> const end(value.size(), 10.0);
    builder.Append(24, end.data(), KFS_Interp_Linear, KFS_Interp_Linear);
    item.stream = builder.Take();
    for (std::size_t i = 0; i < value.size(); ++i) item.components.push_back("c" + std::to_string(i));
    return item;
}

Scene SmallScene()
{
    Scene scene;
    scene.name = "small";
    scene.timeScale = 24;
    scene.streams.push_back(Item("ball", kfshost::StreamKind::Translation, {1.0, 2.0, 3.0}));
    scene.streams.push_back(Item("ball", kfshost::StreamKind::Weights, {0.5}));
    return scene;
}

// What went wrong with a file, or nothing.
std::string LoadFailure(std::string const& fileName)
{
    try {
        kfshost::LoadProject(fileName);
        return "";
    } catch (kfshost::ProjectError const& error) {
        return error.what();
    }
}

// Fails the n-th call that a save makes.
class FailNthCall final : public CKF_IoHook {
public:
    explicit FailNthCall(int n) : left_(n) {}
    int Before(CKF_IoCall call, std::size_t) noexcept override
    {
        // The last call comes when the new file is in its place.
        return call != CKF_IoCall::SyncFolder && --left_ == 0 ? ENOSPC : 0;
    }
    bool Fired() const { return left_ <= 0; }

private:
    int left_;
};

class ProjectFile : public HostTest {
protected:
    std::string Save(Scene scene, std::string const& name) const
    {
        kfshost::SaveProject(*kfshost::MakeTree(std::move(scene)), folder_.Path(name));
        return folder_.Path(name);
    }
    static Scene Load(std::string const& fileName) { return kfshost::TakeScene(kfshost::LoadProject(fileName)); }

    ScratchFolder folder_;
};

// Through a file and back: the same scene, and the same bytes whichever of the two is saved.
void ExpectRoundTrip(std::string const& source, ScratchFolder const& folder)
{
    SCOPED_TRACE(source);
    std::string const first = folder.Path("first");
    std::string const second = folder.Path("second");
    kfshost::SaveProject(*kfshost::MakeTree(kfshost::ImportFile(source)), first);
    auto tree = kfshost::LoadProject(first);
    kfshost::SaveProject(*tree, second);
    EXPECT_TRUE(FileContent(first) == FileContent(second));
    Scene const loaded = kfshost::TakeScene(std::move(tree));
    ExpectSameScene(kfshost::ImportFile(source), loaded);
}

TEST_F(ProjectFile, KeepsTheSample)
{
    ExpectRoundTrip(Sample, folder_);
}

TEST_F(ProjectFile, KeepsRealFiles)
{
    SKIP_WITHOUT_SHARED_DATA();
    for (char const* const name :
         {"gltf/Fox.glb", "gltf/interpolation_test.gltf", "gltf/MorphStressTest.gltf", "bvh/fair1_dab.bvh"})
        ExpectRoundTrip(SharedData(name).string(), folder_);
}

// Paths, with keys that float too: what is derived of them isn't believed and comes out the same.
TEST_F(ProjectFile, KeepsPaths)
{
    auto const makeScene = [](bool roving) {
        Scene scene = kfshost::ImportFile(Sample);
        for (StreamItem& item : scene.streams) {
            if (kfshost::IsPosition(item)) {
                item.stream = kfshost::MakePath(item);
                if (roving) {
                    kfshost::LetInnerKeysFloat(*item.stream);
                    ReadOne(*item.stream, kfshost::Rational(1, 3));  // which is what settles the times of float keys
                }
            }
        }
        return scene;
    };
    for (bool const roving : {false, true}) {
        SCOPED_TRACE(roving);
        Scene const loaded = Load(Save(makeScene(roving), "paths"));
        EXPECT_TRUE(loaded.streams.front().stream->IsSpatial());
        EXPECT_EQ(roving, kfshost::FloatKeyCount(*loaded.streams.front().stream) > 0);
        ExpectSameScene(makeScene(roving), loaded);
    }
}

// Reads fill caches and derive tangents; nothing of it is in a file.
TEST_F(ProjectFile, ReadsLeaveNoTrace)
{
    Scene scene = kfshost::ImportFile(Sample);
    std::string const before = FileContent(Save(kfshost::ImportFile(Sample), "before"));
    for (StreamItem const& item : scene.streams) ReadOne(*item.stream, kfshost::Rational(7, 5));
    EXPECT_TRUE(before == FileContent(Save(std::move(scene), "after")));
    Scene loaded = Load(folder_.Path("after"));
    for (StreamItem const& item : loaded.streams) ReadOne(*item.stream, kfshost::Rational(7, 5));
    EXPECT_TRUE(before == FileContent(Save(std::move(loaded), "again")));
}

// Importers number what has the same path. A tree doesn't have the numbers, and gives them again.
TEST_F(ProjectFile, KeepsThePathsOfNodesWithOneName)
{
    Scene scene;
    scene.name = "twins";
    scene.timeScale = 24;
    double number = 0.0;
    auto const add = [&](std::string const& node, kfshost::StreamKind kind, std::string const& ending) {
        scene.streams.push_back(Item(node, kind, {++number, 0.0, 0.0}));
        scene.streams.back().path += ending;
    };
    add("twin", kfshost::StreamKind::Translation, "");
    add("a/b", kfshost::StreamKind::Scale, "");
    add("twin", kfshost::StreamKind::Scale, "");
    add("twin", kfshost::StreamKind::Translation, "#2");
    add("Node", kfshost::StreamKind::Scale, "");  // what a node is called that has no name
    add("twin", kfshost::StreamKind::Translation, "#3");
    std::map<std::string, double> expected;
    for (StreamItem const& item : scene.streams) expected[item.path] = ReadOne(*item.stream, kfshost::Rational(0, 1));
    std::map<std::string, double> found;
    for (StreamItem const& item : Load(Save(std::move(scene), "twins")).streams)
        found[item.path] = ReadOne(*item.stream, kfshost::Rational(0, 1));
    EXPECT_EQ(expected, found);
}

TEST_F(ProjectFile, KeepsAStreamWithoutKeysAndManyWeights)
{
    Scene scene = SmallScene();
    StreamItem empty;
    empty.animation = "idle";
    empty.node = "ball";
    empty.kind = kfshost::StreamKind::Rotation;
    empty.path = kfshost::PathOf(empty);
    empty.components = {"x", "y", "z", "w"};
    empty.stream = kfshost::StreamBuilder(4, 24, empty.path).Take();
    scene.streams.push_back(std::move(empty));
    scene.streams.push_back(
        Item("face", kfshost::StreamKind::Weights, std::vector<double>(kfshost::StreamBuilder::MaxDimension, 0.25)));
    Scene const loaded = Load(Save(std::move(scene), "wide"));
    auto const items = ByPath(loaded);
    ASSERT_TRUE(items.contains("idle/ball/rotation") && items.contains("walk/face/weights"));
    EXPECT_EQ(0, kfshost::KeyCount(*items.at("idle/ball/rotation")->stream));
    EXPECT_EQ(4u, items.at("idle/ball/rotation")->components.size());
    EXPECT_EQ(0.25, ReadOne(*items.at("walk/face/weights")->stream, kfshost::Rational(0, 1), 817));
}

// What nothing moves isn't in the tree's file: a node shows it with the kind's default value.
TEST_F(ProjectFile, WhatIsNotAnimatedStaysCanonical)
{
    auto const tree = kfshost::MakeTree(SmallScene());
    KFS_StreamBase const* const animation = std::as_const(*tree).GetStream(0u);
    KFS_StreamBase const* const node = animation->GetAsGroup()->GetStream(0u);
    std::vector<bool> canonical;
    for (unsigned int i = 0; i < node->GetAsGroup()->GetNumStreams(); ++i)
        canonical.push_back(node->GetAsGroup()->GetStream(i)->IsCanonical());
    EXPECT_EQ((std::vector<bool>{false, true, true, false, true}), canonical);
    EXPECT_EQ(1.0, ReadOne(*node->GetAsGroup()->GetStream(1u)->GetAsLeaf(), kfshost::Rational(0, 1), 3));
    EXPECT_EQ(1.0, ReadOne(*node->GetAsGroup()->GetStream(2u)->GetAsLeaf(), kfshost::Rational(0, 1), 2));
}

TEST_F(ProjectFile, SaysWhatIsWrong)
{
    std::string const absent = folder_.Path("absent");
    EXPECT_NE(std::string::npos, LoadFailure(absent).find("No such file")) << LoadFailure(absent);

    std::string bytes = FileContent(Save(SmallScene(), "whole"));
    auto const failureWith = [&](std::string const& what, std::string const& instead) {
        std::string changed = bytes;
        std::size_t const at = changed.find(what);
        EXPECT_NE(std::string::npos, at) << what;
        changed.replace(at, what.size(), instead);
        std::string const file = folder_.Write("changed", changed);
        return LoadFailure(file).substr(file.size() + 2);
    };
    EXPECT_EQ("a project, but not one with a scene of this program", failureWith("khsc", "othr"));
    EXPECT_EQ("damaged: walk/ball/translation is described as something else", failureWith("c0\nc1\nc2", "c0\nc1 c2"));
    std::string const scale("\0\0\0\x18\0\0\0\1", 8);
    EXPECT_EQ("damaged: walk/ball/translation isn't in the times of its scene",
              failureWith(scale, std::string("\0\0\0\x19\0\0\0\1", 8)));
    EXPECT_EQ("damaged: the scene has times in 1/0 s", failureWith(scale, std::string("\0\0\0\0\0\0\0\1", 8)));
    reports_.Take();
}

// Wherever a save fails, the file that was there stays, and nothing else is left.
TEST_F(ProjectFile, AFailedSaveLeavesTheOldFile)
{
    auto const tree = kfshost::MakeTree(SmallScene());
    std::string const file = folder_.Write("project", "the old one");
    int n = 1;
    for (;; ++n) {
        FailNthCall hook(n);
        try {
            kfshost::SaveProject(*tree, file, &hook);
            ASSERT_FALSE(hook.Fired()) << n;
            break;
        } catch (kfshost::ProjectError const& error) {
            EXPECT_TRUE(std::string(error.what()).starts_with(file + ": can't be saved: ")) << error.what();
        }
        ASSERT_TRUE(hook.Fired());
        ASSERT_EQ("the old one", FileContent(file)) << n;
        ASSERT_EQ(1, std::distance(std::filesystem::directory_iterator(folder_.Path("")), {})) << n;
    }
    EXPECT_GT(n, 40);
    EXPECT_EQ("", LoadFailure(file));
    reports_.Take();
}

}  // namespace
