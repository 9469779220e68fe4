#include "tree/namedgroup.h"

#include "tests/support/notifications.h"

#include <algorithm>
#include <functional>
#include <thread>

namespace {

using Names = std::vector<std::string>;

class NamedGroup : public SceneTest {};

const Names SceneOrder{"opacity", "transform", "position", "rotation"};

Names NamesOf(KFS_StreamGroup const& group)
{
    Names names;
    for (unsigned int i = 0; i < group.GetNumStreams(); ++i) names.push_back(NameOf(group.GetStream(i)));
    return names;
}

TEST_F(NamedGroup, AKindThatWantsItGetsItsDefaultAgainOnceItIsStored)
{
    for (bool const wants : {false, true}) {
        TestLeaf::needsReset = wants;
        auto const node = MakeNode();
        auto const* const leaf = static_cast<TestLeaf*>(node->GetEditableStream(Name("rotation")));
        EXPECT_EQ(wants ? 2 : 1, leaf->defaultKeys);
    }
    TestLeaf::needsReset = false;
}

TEST_F(NamedGroup, IdentifiersGoByIndexAndCheckTheName)
{
    auto const node = MakeNode();
    for (KFS_StreamID const& id :
         {KFS_StreamID(Name("position")), KFS_StreamID(2), KFS_StreamID(2, Name("position"))}) {
        EXPECT_EQ("position", NameOf(std::as_const(*node).GetStream(id)));
        EXPECT_EQ("position", NameOf(node->GetEditableStream(id)));
    }
    std::pair<KFS_StreamID, char const*> const bad[] = {
        {KFS_StreamID(2, Name("rotation")), "stream at index has wrong matchname"},
        {KFS_StreamID(4), "invalid index in named group"},
        {KFS_StreamID(0xFFFFFFFE, Name("position")), "invalid index in named group"},
        {KFS_StreamID(Name("scale")), "unexpected match name searched for in group"},
        {KFS_StreamID(), "unexpected match name searched for in group"},
    };
    for (auto const& [id, text] : bad) {
        ExpectBroken(
            reports, text, [&, &id = id] { return std::as_const(*node).GetStream(id); });
        ExpectBroken(reports, text, [&, &id = id] { return node->GetEditableStream(id); });
    }
    EXPECT_EQ(nullptr, node->GetStream(Name("scale"), false)) << "an unknown name may be asked for";
    ExpectBroken(
        reports, "invalid index in named group", [&] { return node->GetStream(4); });
    ExpectBroken(
        reports, "invalid index in named group", [&] { return node->GetEditableStreamNullOK(4); });
    ExpectBroken(
        reports, "unexpected match name searched for in group", [&] { return node->IsModifiedByName(Name("scale")); });
    ExpectBroken(reports, "match name isn't in UI layout", [&] { return node->GetIndexInUILayout(Name("scale")); });
    KFS_StreamID const id = node->SlowGetIDOfChild(node->GetStream(2));
    EXPECT_EQ(KFS_StreamID::NoIndex, id.GetIndex());
    EXPECT_EQ(Name("position"), id.GetMatchName());
}

TEST_F(NamedGroup, TheWalkMeetsRealLeavesDepthFirstWithTheirPaths)
{
    auto const node = MakeNode();
    auto const walk = [&] {
        Names met;
        KFS_StreamIDPath path(KFS_StreamID(7));  // what was there stays in front
        auto note = [&](KFS_Stream* leaf) {
            std::string line = NameOf(leaf);
            for (KFS_StreamID const& id : path.GetPathConst()) line += " " + std::to_string(id.GetIndex());
            EXPECT_TRUE(path.GetLength() == 1 || path.GetTail().GetMatchName() == leaf->GetMatchName());
            met.push_back(line);
        };
        node->ForEachNonCanonicalLeafStream(note, &path);
        EXPECT_EQ(1u, path.GetLength());
        return met;
    };
    EXPECT_EQ(Names{}, walk());
    node->GetEditableStream(Name("rotation"));
    node->GetEditableStream(Name("transform"))->GetAsNamedGroup()->GetEditableStream(Name("anchor"));
    node->GetEditableStream(Name("opacity"));
    EXPECT_EQ((Names{"opacity 7 0", "anchor 7 1 1", "rotation 7 3"}), walk());
    int count = 0;
    auto counter = [&count](KFS_Stream*) { ++count; };
    node->ForEachNonCanonicalLeafStream(counter, nullptr);
    EXPECT_EQ(3, count);
}

TEST_F(NamedGroup, ManyThreadsFindACanonicalGroupComplete)
{
    for (int round = 0; round < 20; ++round) {
        TestKinds more;
        std::vector<KFS_MatchName> names;
        for (int i = 0; i < 40; ++i) {
            const std::string name = "kind " + std::to_string(i);
            more.Leaf(name.c_str(), 1, i);
            names.push_back(Name(name.c_str()));
        }
        more.Named("crowd", names);
        auto const* const crowd = Get_VX_StreamFactory()->GetCanonicalStream(Name("crowd"))->GetAsNamedGroup();
        EXPECT_EQ(0u, crowd->GetNumStreams()) << "filled in when somebody looks";
        std::vector<std::thread> threads;
        std::vector<int> wrong(4, 0);
        for (int& mine : wrong) {
            threads.emplace_back([&mine, &names, crowd] {
                for (KFS_MatchName const& name : names) {
                    KFS_StreamBase const* const child = crowd->GetStream(name, false);
                    mine += !child || child->GetMatchName() != name;
                }
                mine += crowd->GetNumStreams() != names.size();
            });
        }
        for (std::thread& thread : threads) thread.join();
        EXPECT_EQ(std::vector<int>(4, 0), wrong);
    }
}

TEST_F(NamedGroup, NoFailedAllocationLeavesAnythingBehindOrASlotEmpty)
{
    using Node = KFS_NamedStreamGroup;
    const std::pair<char const*, std::function<void(Node&)>> edits[] = {
        {"a new group", [](Node&) { MakeNode(); }},
        {"a clone",
         [](Node& n) {
             delete n.CloneStream(KFS_CloneStreamParams{true, true});
         }},
        {"an upgrade", [](Node& n) { n.GetEditableStream(Name("position")); }},
        {"a reset", [](Node& n) { n.ResetAllStreamsToCanonical(true); }},
    };
    for (auto const& [what, edit] : edits) {
        SCOPED_TRACE(what);
        auto const make = [] {
            auto node = MakeNode();
            node->GetEditableStream(Name("opacity"));
            node->GetEditableStream(Name("transform"))->GetAsNamedGroup()->GetEditableStream(Name("anchor"));
            return node;
        };
        auto const check = [&](Node& node, int, Q_MemoryCount const& before) {
            if (!node.GetEditableStreamNullOK(Name("position"))) {
                EXPECT_LE(Q_MemoryLive(nullptr).bytes, before.bytes);
                EXPECT_LE(Q_MemoryLive(nullptr).blocks, before.blocks);
            }
            reports.Take();
            EXPECT_EQ(SceneOrder, NamesOf(node));
            EXPECT_FALSE(node.GetEditableStream(Name("transform"))->IsCanonical()) << "what is missing comes on demand";
            EXPECT_EQ(0u, reports.Take().size());
        };
        EXPECT_GE(FailEveryAllocation(
                      make, [&edit = edit](Node& n) { return edit(n), 0; }, check),
                  3);
    }
}

// The host may rename what it has; the end of the group doesn't stumble over it.
TEST_F(NamedGroup, ARenamedChildIsRemovedLikeTheOthers)
{
    MakeNode();  // fills canonical groups in
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    {
        NotificationRecorder recorder;
        TestRoot<TestIndexedGroup> root("layers");
        auto* const node = AddNode(root);
        for (char const* const name : {"opacity", "position", "rotation"})
            recorder.Label(node->GetEditableStream(Name(name)), name);
        node->GetEditableStream(Name("opacity"))->SetMatchName(Name("position"));
        node->GetEditableStream(Name("rotation"))->SetMatchName(Name("no kind"));
        recorder.Take();
        node->ResetAllStreamsToCanonical(false);
        EXPECT_EQ(SceneOrder, NamesOf(*node));
        Notifications const heard = recorder.Take();
        EXPECT_EQ(4, std::count_if(heard.begin(), heard.end(),
                                   [](std::string const& line) { return line.starts_with("after-remove node "); }));
    }
    EXPECT_EQ(0u, reports.Take().size());
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST_F(NamedGroup, WhatAListenerMakesRealInADyingGroupDiesWithIt)
{
    MakeNode();  // fills canonical groups in
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    {
        TestRoot<TestIndexedGroup> root("layers");
        auto* const node = AddNode(root);
        for (char const* const name : {"opacity", "position", "rotation"}) node->GetEditableStream(Name(name));
        NotificationRecorder listener;
        listener.look = [&](KFS_StreamGroup* group, KFS_StreamBase const*) -> std::string {
            if (group == node && listener.Current().starts_with("before-remove")) {
                node->GetEditableStream(Name("opacity"));
                node->GetEditableStream(Name("rotation"));
            }
            return {};
        };
        delete root.RemoveStream(0);
        listener.look = {};
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

// A group type whose kinds of children become more while it is registered.
class Growing : public TestNamedGroup {
public:
    using TestNamedGroup::TestNamedGroup;
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        for (char const* const kind : {"opacity", "rotation", "scale"})
            if (layout->size() < kindCount) layout->push_back(GetFactory()->GetCanonicalStream(Name(kind)));
    }
    static inline std::size_t kindCount = 0;
};

TEST_F(NamedGroup, ACanonicalGroupFollowsEachNewLayout)
{
    KFS_StreamFactory& factory = *Get_VX_StreamFactory();
    Growing::kindCount = 1;
    kinds.Group<Growing>("growing", {});
    auto* const group = factory.GetCanonicalStream(Name("growing"))->GetAsNamedGroup();
    group->EnsureUILayoutComplete();
    EXPECT_EQ(Names{"opacity"}, NamesOf(*group));
    // Nobody looks at the layouts between, so the last one may lie where the first did.
    for (Growing::kindCount = 2; Growing::kindCount < 4; ++Growing::kindCount)
        factory.SetupCanonicalStream(Name("growing"));
    EXPECT_EQ(0u, group->GetNumStreams()) << "filled in when somebody looks";
    EXPECT_EQ("scale", NameOf(group->GetStream(2)));
    EXPECT_EQ((Names{"opacity", "rotation", "scale"}), NamesOf(*group));
}

}  // namespace
