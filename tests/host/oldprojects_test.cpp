#include "frame/services/strings.h"
#include "host/projectfile.h"
#include "overrides/streamexpression.h"
#include "tests/host/hosttest.h"
#include "tests/services/chunkbytes.h"

#include <limits>
#include <utility>

using kfshost::Scene;
using kfshost::SceneGroup;
using kfshost::StreamItem;

namespace {

constexpr char const* Expression = "value * 2";

// "walk/ball/weights", keys 1 and 3 at 0 s and 1 s, with an expression.
std::unique_ptr<SceneGroup> MakeProject()
{
    StreamItem item;
    item.animation = "walk";
    item.node = "ball";
    item.kind = kfshost::StreamKind::Weights;
    item.components = {"w"};
    item.path = kfshost::PathOf(item);
    kfshost::StreamBuilder builder(1, 24, item.path);
    for (int i = 0; i < 2; ++i) {
        double const value = 1.0 + i * 2.0;
        builder.Append(i * 24, &value, KFS_Interp_Linear, KFS_Interp_Linear);
    }
    item.stream = builder.Take();
    KFS_SetStreamExpression(item.stream.get(), Q_AsciiToUTF16String(Expression));
    Scene scene;
    scene.name = "stage";
    scene.timeScale = 24;
    scene.streams.push_back(std::move(item));
    auto tree = kfshost::MakeTree(std::move(scene));
    tree->SetHidden(true);
    return tree;
}

struct Version {
    int major, minor;
};

// Chunks one behind the other without the atoms of an id, and with that of another id under a new one.
std::string Changed(std::string const& chunks, std::string const& dropped, std::string const& id,
                    std::string const& newId)
{
    std::string changed;
    for (std::size_t at = 0; at < chunks.size();) {
        std::string const found = chunks.substr(at, 4);
        std::size_t size = 0;
        for (std::size_t i = 4; i < 8; ++i) size = size << 8 | static_cast<unsigned char>(chunks[at + i]);
        std::string const data = chunks.substr(at + 8, size);
        if (found == "LIST") {
            std::string const type = data.substr(0, 4);
            changed += List(type == id ? newId : type, Changed(data.substr(4), dropped, id, newId));
        } else if (found != dropped) {
            changed += Atom(found == id ? newId : found, data);
        }
        at += 8 + size + (size & 1);
    }
    return changed;
}

// A saved project, changed into what an older program would have written.
class File {
public:
    explicit File(SceneGroup const& tree)
    {
        constexpr std::size_t front = 32;  // the head of the form, and the version
        std::vector<unsigned char> const bytes = kfshost::SaveProjectToMemory(tree, "memory");
        chunks_.assign(bytes.begin() + front, bytes.end());
    }
    File& Of(Version version)
    {
        version_ = version;
        return *this;
    }
    File& Drop(std::string const& id)
    {
        chunks_ = Changed(chunks_, id, "", "");
        return *this;
    }
    File& Rename(std::string const& id, std::string const& newId)
    {
        chunks_ = Changed(chunks_, "", id, newId);
        return *this;
    }
    std::string Bytes() const
    {
        return Form(chunks_, static_cast<std::uint32_t>(version_.major), static_cast<std::uint32_t>(version_.minor));
    }

    std::unique_ptr<SceneGroup> Load() const { return kfshost::LoadProjectFromMemory(Span(Bytes()), "old"); }
    // What Load says, or nothing.
    std::string Failure() const
    {
        try {
            Load();
            return "";
        } catch (kfshost::ProjectError const& error) {
            return error.what();
        }
    }

private:
    std::string chunks_;
    Version version_{95, 0};
};

using OldProjects = HostTest;

// What a version's files don't have stays as a new tree has it; all else loads.
TEST_F(OldProjects, LoadWhatTheirVersionHas)
{
    struct {
        Version version;
        bool flags, names, handles;
    } const cases[] = {
        {{-1, 0}, false, false, true}, {{0, 0}, false, false, true},  {{55, 9}, false, false, true},
        {{56, 0}, true, false, true},  {{57, 0}, true, true, true},   {{60, 0}, true, true, true},
        {{61, 0}, true, true, true},   {{71, 99}, true, true, true},  {{72, 0}, true, true, false},
        {{76, 0}, true, true, false},  {{77, 0}, true, true, false},  {{81, 0}, true, true, false},
        {{82, 0}, true, true, false},  {{88, 2}, true, true, false},  {{88, 3}, true, true, false},
        {{94, 99}, true, true, false}, {{95, -1}, true, true, false}, {{95, 0}, true, true, false},
    };
    auto const original = MakeProject();
    for (auto const& c : cases) {
        SCOPED_TRACE(std::to_string(c.version.major) + '.' + std::to_string(c.version.minor));
        File file(*original);
        if (!c.flags) file.Drop("kfsb");
        if (!c.names) file.Drop("kfsn");
        if (c.handles) file.Rename("Utf8", "expr");
        auto tree = file.Of(c.version).Load();
        EXPECT_EQ(c.flags, tree->IsHidden());
        if (c.flags && c.names)
            EXPECT_TRUE(File(*original).Bytes() == File(*tree).Bytes()) << "what a save makes of it";
        Scene const scene = kfshost::TakeScene(std::move(tree));
        ASSERT_EQ(1u, scene.streams.size());
        StreamItem const& item = scene.streams.front();
        EXPECT_EQ(c.names ? "stage" : "Scene", scene.name);
        EXPECT_EQ(c.names ? "walk/ball/weights" : "Animation/Node/weights", item.path);
        EXPECT_EQ(Expression, Q_UTF16ToMBString(item.stream->GetExprInfo().GetExpression()));
        EXPECT_EQ(2, kfshost::KeyCount(*item.stream));
        EXPECT_EQ(2.0, ReadOne(*item.stream, kfshost::Rational(1, 2)));
    }
}

// A chunk that a version has is missing from its file, or there is one of a form that isn't read any more.
TEST_F(OldProjects, AreRefusedForWhatTheyLack)
{
    constexpr char const* missing = "old: damaged: something is missing that files of its version have";
    constexpr char const* unknown = "old: damaged: a stream has a form that this program doesn't know";
    struct {
        Version version;
        char const *dropped, *id, *newId, *failure;
    } const cases[] = {
        {{57, 0}, "kfsb", "Utf8", "expr", missing},
        {{57, 0}, "kfsn", "Utf8", "expr", ""},   // a name is nothing that has to be there
        {{56, 0}, "", "Utf8", "expr", unknown},  // names before there were any stand in the record's place
        {{71, 0}, "", "", "", missing},
        {{72, 0}, "", "Utf8", "expr", missing},
        {{95, 0}, "kfsb", "", "", missing},
        {{95, 0}, "", "kfb4", "kfb3", unknown},
        {{95, 0}, "", "kfbs", "kfbt", missing},
        {{95, 0}, "seql", "", "", missing},
        {{95, 0}, "khin", "", "", missing},
        {{95, 0}, "kfmn", "", "", missing},
    };
    for (auto const& c : cases) {
        SCOPED_TRACE(std::to_string(c.version.major) + ' ' + c.dropped + c.id);
        EXPECT_EQ(c.failure, File(*MakeProject()).Drop(c.dropped).Rename(c.id, c.newId).Of(c.version).Failure());
    }
    reports_.Take();
}

TEST_F(OldProjects, NewerOnesAreRefused)
{
    constexpr int most = std::numeric_limits<int>::max();
    struct {
        Version version;
        char const* text;
    } const cases[] = {
        {{95, 1}, "95.1"}, {{96, -1}, "96.-1"}, {{96, 0}, "96.0"}, {{most, most}, "2147483647.2147483647"}};
    for (auto const& c : cases) {
        EXPECT_EQ("old: a project of version " + std::string(c.text) + ", which is newer than this program's 95.0",
                  File(*MakeProject()).Of(c.version).Failure());
    }
}

}  // namespace
