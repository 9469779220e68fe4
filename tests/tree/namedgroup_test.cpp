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

TEST_F(NamedGroup, ANewOneHasAllItsChildrenInDisplayOrder)
{
    auto const node = MakeNode();
    EXPECT_EQ(SceneOrder, NamesOf(*node));
    for (unsigned int i = 0; i < 4; ++i) {
        KFS_StreamBase const* const child = node->GetStream(i);
        SCOPED_TRACE(NameOf(child));
        EXPECT_EQ(i, node->GetIndexInUILayout(child->GetMatchName()));
        EXPECT_EQ(child, node->GetStream(child->GetMatchName(), true));
        if (child->IsLeaf()) {
            EXPECT_EQ(Canonical(NameOf(child).c_str()), child) << "a leaf is shared until somebody edits it";
            EXPECT_EQ(nullptr, child->GetParent());
        }
    }
    KFS_StreamBase const* const transform = node->GetStream(1);
    EXPECT_FALSE(transform->IsCanonical()) << "a subgroup is the group's own";
    EXPECT_EQ(node.get(), transform->GetParent());
    EXPECT_EQ(Canonical("scale"), transform->GetAsGroup()->GetStream(0));
    EXPECT_EQ(FX_Param_GROUP, node->GetParamDef().paramType);
    EXPECT_FALSE(node->IsModified());
    EXPECT_FALSE(node->IsAnimated(false));
}

TEST_F(NamedGroup, LookingNeverMakesAStreamAndAskingForAnEditableOneMakesItOnce)
{
    auto const node = MakeNode();
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    EXPECT_EQ(nullptr, node->GetEditableStreamNullOK(Name("opacity")));
    EXPECT_EQ(nullptr, node->GetEditableStreamNullOK(0u));
    EXPECT_EQ(nullptr, node->GetEditableLeafStreamNullOK(Name("opacity")));
    EXPECT_EQ(Canonical("opacity"), node->GetLeafStream(Name("opacity")));
    EXPECT_EQ(nullptr, node->GetLeafStream(Name("transform")));
    EXPECT_EQ(nullptr, node->FindEditableLeafStreamNullOK(KFS_StreamIDPath(KFS_StreamID(Name("opacity")))));
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    KFS_Stream* const opacity = node->GetEditableLeafStream(Name("opacity"));
    ASSERT_NE(nullptr, opacity);
    EXPECT_FALSE(opacity->IsCanonical());
    EXPECT_EQ(node.get(), opacity->GetParent());
    EXPECT_EQ(100.0, static_cast<TestLeaf*>(opacity)->ValueAt(0));
    EXPECT_TRUE(opacity->HasNoKeys());
    for (KFS_StreamBase* const again :
         {node->GetEditableStream(0u), node->GetEditableStream(Name("opacity")), node->GetEditableStreamNullOK(0u)})
        EXPECT_EQ(opacity, again);
    EXPECT_EQ(opacity, node->GetEditableLeafStreamNullOK(Name("opacity")));
    EXPECT_EQ(SceneOrder, NamesOf(*node));
}

TEST_F(NamedGroup, AStreamMadeRealHasItsGroupsTimeScale)
{
    TestRoot<TestNamedGroup> root("node", 30);
    EXPECT_EQ(30u, root.GetEditableLeafStream(Name("position"))->GetTimeScale());
    auto* const transform = root.GetEditableStream(Name("transform"))->GetAsNamedGroup();
    EXPECT_EQ(30u, transform->GetPreferredTimeScale());
    EXPECT_EQ(30u, transform->GetEditableLeafStream(Name("scale"))->GetTimeScale());
    EXPECT_EQ(600u, Canonical("scale")->GetAsLeaf()->GetTimeScale());
    EXPECT_EQ(600u, MakeNode()->GetPreferredTimeScale()) << "without a parent";
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

TEST_F(NamedGroup, ASwapGivesBackWhatWasReal)
{
    auto const node = MakeNode();
    auto first = TestKinds::Make("rotation"), second = TestKinds::Make("rotation");
    KFS_StreamBase *const a = first.get(), *const b = second.get();
    EXPECT_EQ(nullptr, node->SwapStream(&first)) << "a canonical stream stays the factory's";
    EXPECT_EQ(nullptr, first.get());
    EXPECT_EQ(node.get(), a->GetParent());
    EXPECT_EQ(a, node->GetStream(3));
    Q_ScAutoPtr<KFS_StreamBase> const left(node->SwapStream(&second));
    EXPECT_EQ(a, left.get());
    EXPECT_EQ(nullptr, a->GetParent());
    EXPECT_EQ(b, node->GetStream(3));
    auto foreign = TestKinds::Make("scale");
    ExpectBroken(reports, "invalid name for storing in this named group", [&] { return node->SwapStream(&foreign); });
    EXPECT_NE(nullptr, foreign.get());
    TestNamedGroup bare(Name("no kind"), Get_VX_StreamFactory(), false, {});
    EXPECT_EQ(nullptr, bare.SwapStream(&foreign)) << "without a layout nothing can be stored";
    EXPECT_NE(nullptr, foreign.get());
    EXPECT_EQ(0u, bare.GetNumStreams());
}

TEST_F(NamedGroup, ASlotCanBeMadeCanonicalAgain)
{
    auto const node = MakeNode();
    EXPECT_EQ(nullptr, node->SwapCanonicalForStream(Name("opacity"))) << "it is";
    KFS_StreamBase* const opacity = node->GetEditableStream(Name("opacity"));
    Q_ScAutoPtr<KFS_StreamBase> const left(node->SwapCanonicalForStream(Name("opacity")));
    EXPECT_EQ(opacity, left.get());
    EXPECT_EQ(nullptr, opacity->GetParent());
    EXPECT_EQ(Canonical("opacity"), node->GetStream(0));
    EXPECT_EQ(nullptr, Canonical("opacity")->GetParent());
    Q_ScAutoPtr<KFS_StreamBase> const transform(node->SwapCanonicalForStream(Name("transform")));
    EXPECT_EQ(Canonical("transform"), node->GetStream(1));
    EXPECT_FALSE(node->GetEditableStream(Name("transform"))->IsCanonical());
}

TEST_F(NamedGroup, ACloneCopiesWhatIsRealAndSharesTheRest)
{
    auto const node = MakeNode();
    auto* const opacity = node->GetEditableLeafStream(Name("opacity"));
    T_Time const at{300, 600};
    double const value = 25.0;
    ASSERT_EQ(0, opacity->SetConstant(false, true));
    ASSERT_EQ(0, KFS_InsertKeyF(opacity, &at, 1, &value, KFS_Interp_Linear, KFS_Interp_Linear));
    for (bool const withKeys : {true, false}) {
        Q_ScAutoPtr<KFS_StreamBase> const copy(node->CloneStream(KFS_CloneStreamParams{withKeys, true}));
        auto* const group = copy->GetAsNamedGroup();
        EXPECT_EQ(nullptr, group->GetParent());
        EXPECT_EQ(NamesOf(*node), NamesOf(*group));
        auto* const its = group->GetEditableStreamNullOK(0u);
        ASSERT_NE(nullptr, its);
        EXPECT_NE(opacity, its);
        EXPECT_EQ(group, its->GetParent());
        EXPECT_EQ(withKeys ? 2 : 0, its->GetAsLeaf()->GetKeyCount());
        EXPECT_EQ(Canonical("position"), group->GetStream(2));
        EXPECT_EQ(group, group->GetStream(1)->GetParent()) << "a real subgroup is cloned";
        EXPECT_NE(node->GetStream(1), group->GetStream(1));
    }
}

TEST_F(NamedGroup, ACloneOfADeepCanonicalGroupStaysSharedUntilItIsAskedFor)
{
    kinds.Named("outer", {Name("node")});
    kinds.Named("outermost", {Name("outer")});
    auto const made = TestKinds::Make("outermost");
    auto* const outermost = made->GetAsNamedGroup();
    KFS_StreamGroup const* const outer = outermost->GetStream(0)->GetAsGroup();
    EXPECT_FALSE(outer->IsCanonical());
    EXPECT_EQ(Canonical("node"), outer->GetStream(0)) << "two levels down a group is shared";
    EXPECT_EQ(4u, outer->GetStream(0)->GetAsGroup()->GetNumStreams()) << "and complete for whoever looks";
    const KFS_StreamIDPath path(KFS_StreamID(0), KFS_StreamID(Name("node")), KFS_StreamID(Name("opacity")));
    EXPECT_EQ(Canonical("opacity"), outermost->FindStream(path));
    EXPECT_EQ(nullptr, outermost->FindEditableLeafStreamNullOK(path));
    EXPECT_EQ(Canonical("node"), outer->GetStream(0));
    KFS_StreamBase* const opacity = outermost->FindEditableStream(path);
    EXPECT_FALSE(opacity->IsCanonical());
    EXPECT_FALSE(outer->GetStream(0)->IsCanonical()) << "every stream on the way is made real";
    EXPECT_EQ(outer->GetStream(0), opacity->GetParent());
    EXPECT_EQ(opacity, outermost->FindEditableLeafStreamNullOK(path));
    EXPECT_EQ(outermost, outermost->GetStream(0)->GetParent());
}

TEST_F(NamedGroup, PathsLeadThroughGroupsOnly)
{
    auto const node = MakeNode();
    EXPECT_EQ(node.get(), node->FindStream(KFS_StreamIDPath()));
    EXPECT_EQ(node.get(), node->FindEditableStream(KFS_StreamIDPath()));
    EXPECT_EQ(nullptr, node->FindEditableLeafStreamNullOK(KFS_StreamIDPath())) << "a group is no leaf";
    const KFS_StreamIDPath through(KFS_StreamID(Name("opacity")), KFS_StreamID(0));
    ExpectBroken(reports, "expected group", [&] { return node->FindStream(through); });
    EXPECT_EQ(Canonical("opacity"), node->GetStream(0));
    ExpectBroken(reports, "expected group", [&] { return node->FindEditableStream(through); });
    const KFS_StreamIDPath unknown(KFS_StreamID(Name("transform")), KFS_StreamID(Name("opacity")));
    ExpectBroken(reports, "unexpected match name searched for in group", [&] { return node->FindStream(unknown); });
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

TEST_F(NamedGroup, WhatAChildIsItsGroupIs)
{
    auto const node = MakeNode();
    auto* const transform = node->GetEditableStream(Name("transform"))->GetAsNamedGroup();
    auto* const scale = transform->GetEditableLeafStream(Name("scale"));
    EXPECT_FALSE(node->IsModified()) << "a real stream with its default value changes nothing";
    T_Time const zero{0, 600};
    double const value[2] = {2.0, 3.0};
    ASSERT_EQ(0, KFS_InsertKeyF(scale, &zero, 1, value, 0, 0));
    EXPECT_TRUE(node->IsModified());
    EXPECT_TRUE(node->IsModifiedByName(Name("transform")));
    EXPECT_FALSE(node->IsModifiedByName(Name("opacity")));
    EXPECT_FALSE(node->IsAnimated(true));
    ASSERT_EQ(0, scale->SetConstant(false, true));
    EXPECT_TRUE(node->IsAnimated(false));
}

TEST_F(NamedGroup, IndependenceReachesTheRealChildrenAndMakesNone)
{
    auto const node = MakeNode();
    KFS_StreamBase* const opacity = node->GetEditableStream(Name("opacity"));
    node->MakeIndependent(true);
    EXPECT_TRUE(node->IsIndependent());
    EXPECT_TRUE(opacity->IsIndependent());
    EXPECT_TRUE(node->GetStream(Name("transform"), true)->IsIndependent());
    EXPECT_FALSE(Canonical("position")->IsIndependent());
    EXPECT_EQ(Canonical("position"), node->GetStream(2));
    opacity->MakeIndependent(false);
    node->MakeIndependent(true);
    EXPECT_FALSE(opacity->IsIndependent()) << "a group that is so already passes nothing on";
    node->MakeIndependent(false);
    EXPECT_FALSE(node->GetStream(Name("transform"), true)->IsIndependent());
}

TEST_F(NamedGroup, AResetGoesBackToTheDefaults)
{
    auto const node = MakeNode();
    node->GetEditableStream(Name("opacity"));
    node->GetEditableStream(Name("transform"))->GetAsNamedGroup()->GetEditableStream(Name("scale"));
    node->ResetAllStreamsToCanonical(false);
    EXPECT_EQ(nullptr, node->GetEditableStreamNullOK(0u));
    EXPECT_EQ(Canonical("scale"), node->GetStream(1)->GetAsGroup()->GetStream(0));
    EXPECT_EQ(SceneOrder, NamesOf(*node));
    auto* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("node"))->GetAsNamedGroup();
    canonical->EnsureUILayoutComplete();
    KFS_StreamBase const* const before = canonical->GetStream(0);
    canonical->ResetAllStreamsToCanonical(false);
    EXPECT_EQ(4u, canonical->GetNumStreams()) << "a canonical group is let alone";
    EXPECT_EQ(before, canonical->GetStream(0));
}

TEST_F(NamedGroup, AcceptableStreamsAreClonedOver)
{
    kinds.Named("flat", {Name("rotation"), Name("scale")});
    auto const node = MakeNode();
    auto* const rotation = node->GetEditableLeafStream(Name("rotation"));
    T_Time const zero{0, 600};
    double const value = 45.0;
    ASSERT_EQ(0, KFS_InsertKeyF(rotation, &zero, 1, &value, 0, 0));
    node->GetEditableStream(Name("opacity"));  // has no place there
    auto const made = TestKinds::Make("flat");
    auto* const flat = made->GetAsNamedGroup();
    flat->CopyAcceptableStreams(*node);
    auto const* const its = static_cast<TestLeaf const*>(flat->GetStream(0));
    EXPECT_NE(rotation, its);
    EXPECT_EQ(flat, its->GetParent());
    EXPECT_EQ(45.0, its->ValueAt(0));
    EXPECT_EQ(Canonical("scale"), flat->GetStream(1));
    EXPECT_EQ(rotation, node->GetStream(3));
}

TEST_F(NamedGroup, AChildOnItsWayOutLeavesAnEmptySlot)
{
    auto const node = MakeNode();
    Q_ScAutoPtr<KFS_StreamBase> const rotation(node->GetEditableStream(Name("rotation")));
    auto const stranger = TestKinds::Make("rotation");
    EXPECT_FALSE(node->RemoveChild(stranger.get()));
    EXPECT_TRUE(node->RemoveChild(rotation.get()));
    EXPECT_EQ(nullptr, rotation->GetParent());
    EXPECT_EQ(3u, node->GetNumStreams());
    EXPECT_EQ(nullptr, node->GetStream(Name("rotation"), false));
    EXPECT_FALSE(node->RemoveChild(rotation.get()));
    node->ResetAllStreamsToCanonical(false);
    EXPECT_EQ(4u, node->GetNumStreams());
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

// What a listener throws stops the edit where it is; no stream is lost or deleted twice, the canonical ones least of
// all. The list holds an opacity, and a node with one of its own.
TEST_F(NamedGroup, AListenersFailureLosesNoStream)
{
    using List = KFS_IndexedStreamGroup;
    using Node = KFS_NamedStreamGroup;
    struct Row {
        char const* at;  // the notification from which the listener throws
        char const* edit;
        std::function<void(List&, Node&)> act;
        unsigned int children;  // of the list, afterwards
        bool real;              // whether the node's "opacity" is so afterwards
    };
    auto const insert = [](List& l, Node&) {
        auto made = TestKinds::Make("opacity");
        l.InsertStream(0, &made);
    };
    auto const swapInList = [](List& l, Node&) {
        auto made = TestKinds::Make("opacity");
        delete l.SwapStream(0, &made);
    };
    auto const remove = [](List& l, Node&) { delete l.RemoveStream(0); };
    auto const upgrade = [](List&, Node& n) { n.GetEditableStream(Name("rotation")); };
    auto const swap = [](List&, Node& n) {
        auto made = TestKinds::Make("opacity");
        delete n.SwapStream(&made);
    };
    auto const downgrade = [](List&, Node& n) { delete n.SwapCanonicalForStream(Name("opacity")); };
    auto const reset = [](List&, Node& n) { n.ResetAllStreamsToCanonical(true); };
    Row const rows[] = {
        {"before-insert", "insert", insert, 2, true},
        {"after-insert", "insert", insert, 3, true},
        {"before-swap", "swap in the list", swapInList, 2, true},
        {"after-swap", "swap in the list", swapInList, 2, true},
        {"before-remove", "remove", remove, 2, true},
        {"after-remove", "remove", remove, 1, true},
        {"before-swap", "upgrade", upgrade, 2, true},
        {"after-swap", "upgrade", upgrade, 2, true},
        {"before-swap", "swap", swap, 2, true},
        {"after-swap", "swap", swap, 2, true},
        {"before-swap", "downgrade", downgrade, 2, true},
        {"after-swap", "downgrade", downgrade, 2, false},
        {"before-remove node opacity", "reset", reset, 2, true},
        {"after-remove node opacity", "reset", reset, 2, true},
    };
    auto* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"));
    MakeNode();  // fills canonical groups in
    for (Row const& row : rows) {
        SCOPED_TRACE(testing::Message() << row.edit << ", " << row.at);
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        {
            TestRoot<TestIndexedGroup> root("layers");
            auto opacity = TestKinds::Make("opacity");
            root.AppendStream(&opacity);
            auto* const node = AddNode(root);
            node->GetEditableStream(Name("opacity"));
            {
                NotificationRecorder listener;
                listener.ThrowAt(row.at);
                EXPECT_EQ(77, KFSp_Boundary([&] { row.act(root, *node); }));
            }
            EXPECT_EQ(row.children, root.GetNumStreams());
            EXPECT_EQ(SceneOrder, NamesOf(*node));
            EXPECT_EQ(row.real, node->GetEditableStreamNullOK(0u) != nullptr);
            EXPECT_EQ(canonical, Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity")));
            EXPECT_EQ(100.0, static_cast<TestLeaf*>(canonical)->ValueAt(0));
        }
        EXPECT_EQ(before, Q_MemoryLive(nullptr));
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
