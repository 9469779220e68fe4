#include "host/projectfile.h"

#include "host/import.h"
#include "host/paths.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"
#include "tests/host/hosttest.h"
#include "tests/support/places.h"

#include <climits>
#include <ios>
#include <map>
#include <sstream>
#include <tuple>
#include <utility>

using kfshost::Rational;
using kfshost::Scene;
using kfshost::StreamItem;

namespace {

// The values at all keys and at a number of times from before the first to behind the last, to the last bit.
void Tell(KFS_Stream const& stream, std::ostream& text)
{
    text << stream.GetDimension() << " in 1/" << stream.GetTimeScale() << (stream.IsSpatial() ? " path" : "");
    std::vector<double> row(static_cast<std::size_t>(stream.GetDimension()));
    auto const tellAt = [&](Rational const& time) {
        kfshost::ReadAt(stream, time, row.data());
        text << '\n' << time.ToString() << std::hexfloat;
        for (double const number : row) text << ' ' << number;
    };
    int const keys = stream.GetKeyCount();
    for (int i = 0; i < keys; ++i) tellAt(kfshost::KeyTime(stream, i));
    if (keys == 0) return;
    constexpr int steps = 61;  // doesn't divide what keys are placed by
    Rational const first = kfshost::KeyTime(stream, 0) - Rational(1, 10);
    Rational const last = kfshost::KeyTime(stream, keys - 1) + Rational(1, 10);
    for (int step = 0; step <= steps; ++step) tellAt(first + (last - first) * Rational(step, steps));
}

// Everything about a scene, and about its streams by path.
std::map<std::string, std::string> Told(Scene const& scene)
{
    std::map<std::string, std::string> told;
    std::ostringstream whole;
    whole << scene.name << ' ' << scene.timeScale << scene.exactTimes << std::hexfloat << scene.worstTimeError;
    told[""] = whole.str();
    for (StreamItem const& item : scene.streams) {
        std::ostringstream text;
        text << item.animation << '/' << item.node << ' ' << NameOf(item.kind) << ' ' << NameOf(item.interpolation);
        for (std::string const& name : item.components) text << ' ' << name;
        Tell(*item.stream, text);
        EXPECT_TRUE(told.emplace(item.path, text.str()).second) << item.path;
    }
    return told;
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

class ProjectFile : public HostTest {
protected:
    std::string Save(Scene scene, std::string const& name) const
    {
        kfshost::SaveProject(*kfshost::MakeTree(std::move(scene)), folder_.Path(name));
        return folder_.Path(name);
    }
    static Scene Load(std::string const& fileName) { return kfshost::TakeScene(kfshost::LoadProject(fileName)); }

    // Through a file and back it is the same scene, and the same bytes whichever of the two is saved. Reads fill caches
    // and derive tangents; nothing of it is in a file.
    template <class Make>
    void ExpectKept(Make const& make)
    {
        std::string const bytes = FileContent(Save(make(), "before reads"));
        Scene scene = make();
        auto const told = Told(scene);
        EXPECT_TRUE(bytes == FileContent(Save(std::move(scene), "after reads")));
        Scene loaded = Load(folder_.Path("before reads"));
        EXPECT_TRUE(told == Told(loaded));
        EXPECT_TRUE(bytes == FileContent(Save(std::move(loaded), "loaded")));
    }

    ScratchFolder folder_;
};

// Also with keys that float: what is derived of paths isn't believed and comes out the same.
TEST_F(ProjectFile, KeepsPaths)
{
    for (bool const isFloating : {false, true}) {
        ExpectKept([&] {
            Scene scene = kfshost::ImportFile(kfstest::SamplesFolder() / "bouncing_ball.gltf");
            StreamItem& item = scene.streams.front();
            item.stream = kfshost::MakePath(item);
            if (isFloating) kfshost::LetInnerKeysFloat(*item.stream);
            EXPECT_EQ(isFloating, kfshost::FloatKeyCount(*item.stream) > 0);
            Told(scene);  // reads settle the lengths of paths and the times of float keys, which are saved
            return scene;
        });
    }
}

TEST_F(ProjectFile, KeepsRealFiles)
{
    SKIP_WITHOUT_SHARED_DATA();
    for (char const* const name :
         {"gltf/Fox.glb", "gltf/interpolation_test.gltf", "gltf/MorphStressTest.gltf", "bvh/fair1_dab.bvh"}) {
        SCOPED_TRACE(name);
        ExpectKept([&] { return kfshost::ImportFile(SharedData(name).string()); });
    }
}

// Importers number what has the same path. A tree doesn't have the numbers, and gives them again. Streams may have no keys,
// and as many components as there can be.
TEST_F(ProjectFile, KeepsNamesAndShapes)
{
    ExpectKept([] {
        Scene scene = SmallScene();
        double number = 0.0;
        auto const add = [&](std::string const& node, kfshost::StreamKind kind, std::string const& ending) {
            scene.streams.push_back(Item(node, kind, {++number, 0.0, 0.0}));
            scene.streams.back().path += ending;
        };
        add("twin", kfshost::StreamKind::Translation, "");
        add("twin", kfshost::StreamKind::Scale, "");
        add("twin", kfshost::StreamKind::Translation, "#2");
        add("twin", kfshost::StreamKind::Translation, "#3");
        add("a/b", kfshost::StreamKind::Scale, "");
        add("Node", kfshost::StreamKind::Scale, "");  // what a node is called that has no name
        scene.streams.push_back(Item("face", kfshost::StreamKind::Weights,
                                     std::vector<double>(kfshost::StreamBuilder::MaxDimension, 0.25)));
        scene.streams.push_back(Item("idle", kfshost::StreamKind::Rotation, {0.0, 0.0, 0.0, 1.0}));
        scene.streams.back().stream = kfshost::StreamBuilder(4, 24, "idle").Take();
        return scene;
    });
}

// What nothing moves isn't in the tree's file: a node shows it with the kind's default value. Followers stand behind their
// leader.
TEST_F(ProjectFile, WhatIsNotAnimatedStaysCanonical)
{
    auto const tree = kfshost::MakeTree(SmallScene());
    KFS_StreamBase const* const animation = std::as_const(*tree).GetStream(0u);
    KFS_StreamBase const* const node = animation->GetAsGroup()->GetStream(0u);
    std::vector<bool> canonical;
    for (unsigned int i = 0; i < node->GetAsGroup()->GetNumStreams(); ++i)
        canonical.push_back(node->GetAsGroup()->GetStream(i)->IsCanonical());
    EXPECT_EQ((std::vector<bool>{false, true, true, true, true, true, false, true}), canonical);
    EXPECT_EQ(1.0, ReadOne(*node->GetAsGroup()->GetStream(4u)->GetAsLeaf(), kfshost::Rational(0, 1), 3));
    EXPECT_EQ(1.0, ReadOne(*node->GetAsGroup()->GetStream(5u)->GetAsLeaf(), kfshost::Rational(0, 1), 2));
}

// A saved project with one thing replaced, or another version that it says it has.
TEST_F(ProjectFile, SaysWhatIsWrong)
{
    std::string const absent = folder_.Path("absent");
    EXPECT_NE(std::string::npos, LoadFailure(absent).find("No such file")) << LoadFailure(absent);

    std::string const bytes = FileContent(Save(SmallScene(), "whole"));
    auto const word = [](int number) {
        return std::string{static_cast<char>(number >> 24), static_cast<char>(number >> 16),
                           static_cast<char>(number >> 8), static_cast<char>(number)};
    };
    auto const failure = [&](int major, int minor, std::string const& what = "", std::string const& instead = "") {
        std::string changed = bytes;
        changed.replace(20, 8, word(major) + word(minor));
        EXPECT_NE(std::string::npos, changed.find(what)) << what;
        for (std::size_t at = 0; (at = changed.find(what, at)) != std::string::npos; at += 4) {
            changed.replace(at, what.size(), instead);
            if (what.size() != 4) break;  // of ids all are others
        }
        std::string const file = folder_.Write("changed", changed), error = LoadFailure(file);
        return error.starts_with(file + ": ") ? error.substr(file.size() + 2) : error;
    };
    for (auto const& [major, minor] : {std::pair{95, 0}, {95, -1}, {94, 99}, {82, 0}, {57, 0}})
        EXPECT_EQ("", failure(major, minor)) << major;
    for (auto const& [major, minor] : {std::pair{95, 1}, {96, -1}, {96, 0}, {INT_MAX, INT_MAX}})
        EXPECT_EQ("a project of version " + std::to_string(major) + "." + std::to_string(minor) +
                      ", which is newer than this program's 95.0",
                  failure(major, minor));
    std::string const unknown = "damaged: a stream has a form that this program doesn't know";
    EXPECT_EQ(unknown, failure(56, 0)) << "names before there were any stand in the record's place";
    EXPECT_EQ(unknown, failure(95, 0, "kfb4", "kfb3"));
    for (char const* const id : {"kfsb", "kfbs", "seql", "khin", "kfmn"})
        EXPECT_EQ("damaged: something is missing that files of its version have", failure(95, 0, id, "what")) << id;
    std::string const scale = word(24) + word(1);
    for (auto const& [what, instead, error] :
         {std::tuple<std::string, std::string, char const*>{"khsc", "othr",
                                                            "a project, but not one with a scene of this program"},
          {"c0\nc1\nc2", "c0\nc1 c2", "damaged: walk/ball/translation is described as something else"},
          {scale, word(25) + word(1), "damaged: walk/ball/translation isn't in the times of its scene"},
          {scale, word(0) + word(1), "damaged: the scene has times in 1/0 s"}})
        EXPECT_EQ(error, failure(95, 0, what, instead));
    reports_.Take();
}

}  // namespace
