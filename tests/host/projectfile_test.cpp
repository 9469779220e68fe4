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
#include <utility>

using kfshost::Rational;
using kfshost::Scene;
using kfshost::StreamItem;

namespace {

// All keys, and the values at a number of times from before the first to behind the last key, to the last bit.
void Tell(KFS_Stream const& stream, std::ostream& text)
{
    text << stream.GetDimension() << " in 1/" << stream.GetTimeScale() << (stream.IsSpatial() ? " path" : "");
    std::vector<double> row(static_cast<std::size_t>(stream.GetDimension()));
    auto const tellRow = [&](Rational const& time) {
        text << '\n' << time.ToString() << std::hexfloat;
        for (double const number : row) text << ' ' << number;
    };
    int const keys = stream.GetKeyCount();
    for (int i = 0; i < keys; ++i) {
        char in = 0;
        char out = 0;
        EXPECT_EQ(0, KFS_GetKeyF(&stream, i, row.data(), &in, &out));
        tellRow(kfshost::KeyTime(stream, i));
        text << ' ' << int{in} << int{out};
    }
    if (keys == 0) return;
    constexpr int steps = 61;  // doesn't divide what keys are placed by
    Rational const first = kfshost::KeyTime(stream, 0) - Rational(1, 10);
    Rational const last = kfshost::KeyTime(stream, keys - 1) + Rational(1, 10);
    for (int step = 0; step <= steps; ++step) {
        Rational const time = first + (last - first) * Rational(step, steps);
        kfshost::ReadAt(stream, time, row.data());
        tellRow(time);
    }
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

// Paths too, with keys that float: what is derived of them isn't believed and comes out the same.
TEST_F(ProjectFile, KeepsTheSample)
{
    for (int const form : {0, 1, 2}) {
        SCOPED_TRACE(form);
        ExpectKept([&] {
            Scene scene = kfshost::ImportFile(kfstest::SamplesFolder() / "bouncing_ball.gltf");
            StreamItem& item = scene.streams.front();
            if (form > 0) item.stream = kfshost::MakePath(item);
            if (form == 2) {
                kfshost::LetInnerKeysFloat(*item.stream);
                EXPECT_LT(0U, kfshost::FloatKeyCount(*item.stream));
            }
            if (form > 0)
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

// A saved project with one thing replaced, and the version that it says it has.
TEST_F(ProjectFile, SaysWhatIsWrong)
{
    std::string const absent = folder_.Path("absent");
    EXPECT_NE(std::string::npos, LoadFailure(absent).find("No such file")) << LoadFailure(absent);

    std::string const bytes = FileContent(Save(SmallScene(), "whole"));
    constexpr std::size_t major = 20;
    constexpr std::size_t minor = 24;
    auto const word = [](int number) {
        std::string text(4, '\0');
        for (std::size_t i = 0; i < 4; ++i)
            text[i] = static_cast<char>(static_cast<unsigned int>(number) >> (24 - 8 * i));
        return text;
    };
    std::string const scale = word(24) + word(1);
    std::string const missing = "damaged: something is missing that files of its version have";
    std::string const unknown = "damaged: a stream has a form that this program doesn't know";
    auto const newer = [](std::string const& version) {
        return "a project of version " + version + ", which is newer than this program's 95.0";
    };
    struct Row {
        int major, minor;
        std::string what, instead, failure;
    };
    for (Row const& row :
         {Row{95, 0, "", "", ""},
          {95, -1, "", "", ""},
          {94, 99, "", "", ""},
          {82, 0, "", "", ""},
          {57, 0, "", "", ""},
          {95, 1, "", "", newer("95.1")},
          {96, -1, "", "", newer("96.-1")},
          {96, 0, "", "", newer("96.0")},
          {INT_MAX, INT_MAX, "", "", newer("2147483647.2147483647")},
          {56, 0, "", "", unknown},  // names before there were any stand in the record's place
          {95, 0, "kfsb", "what", missing},
          {95, 0, "kfb4", "kfb3", unknown},
          {95, 0, "kfbs", "kfbt", missing},
          {95, 0, "seql", "what", missing},
          {95, 0, "khin", "what", missing},
          {95, 0, "kfmn", "what", missing},
          {95, 0, "khsc", "othr", "a project, but not one with a scene of this program"},
          {95, 0, "c0\nc1\nc2", "c0\nc1 c2", "damaged: walk/ball/translation is described as something else"},
          {95, 0, scale, word(25) + word(1), "damaged: walk/ball/translation isn't in the times of its scene"},
          {95, 0, scale, word(0) + word(1), "damaged: the scene has times in 1/0 s"}}) {
        SCOPED_TRACE(testing::Message() << row.major << '.' << row.minor << ' ' << row.what);
        std::string changed = bytes;
        changed.replace(major, 4, word(row.major)).replace(minor, 4, word(row.minor));
        ASSERT_NE(std::string::npos, changed.find(row.what));
        for (std::size_t at = 0; (at = changed.find(row.what, at)) != std::string::npos; at += 4) {
            changed.replace(at, row.what.size(), row.instead);
            if (row.what.size() != 4) break;  // of ids all are others
        }
        std::string const file = folder_.Write("changed", changed);
        EXPECT_EQ(row.failure.empty() ? "" : file + ": " + row.failure, LoadFailure(file));
    }
    reports_.Take();
}

}  // namespace
