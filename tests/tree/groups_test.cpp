#include "tests/support/baregroup.h"
#include "tests/support/dice.h"
#include "tests/support/notifications.h"
#include "tree/layoutorder_private.h"

#include <algorithm>
#include <functional>
#include <map>
#include <thread>

// What the twin doesn't say of groups: what they refuse, failures, threads, and kinds that behave in their own way.

namespace {

using Names = std::vector<std::string>;
using hearth::utility::Guid;

class Groups : public SceneTest {
protected:
    static Q_ScAutoPtr<KFS_StreamBase> Clone(KFS_StreamBase const& stream)
    {
        return Q_ScAutoPtr<KFS_StreamBase>(stream.CloneStream(KFS_CloneStreamParams{true, true}));
    }
    static Names NamesOf(KFS_StreamGroup const& group)
    {
        Names names;
        for (unsigned int i = 0; i < group.GetNumStreams(); ++i) names.push_back(NameOf(group.GetStream(i)));
        return names;
    }
    Names const SceneOrder{"opacity", "transform", "position", "rotation"};
};

TEST_F(Groups, QuestionsForWhatIsNotThereAreRefused)
{
    auto const node = MakeNode();
    TestRoot<TestIndexedGroup> list("layers");
    TestIndexedGroup homeless(Name("layers"), nullptr, false, {});
    Q_ScAutoPtr<KFS_StreamBase> child = TestKinds::Make("opacity"), x = TestKinds::Make("opacity");
    list.AppendStream(&child);
    KFS_NamedStreamGroup const& constNode = *node;
    KFS_IndexedStreamGroup const& constList = list;
    struct {
        char const* text;
        std::vector<std::function<void()>> questions;
    } const rows[] = {
        {"invalid index in indexed group",
         {[&] { constList.GetStream(1); }, [&] { list.GetEditableStream(0xFFFFFFFF); },
          [&] { list.GetEditableStreamNullOK(1); }, [&] { list.GetLeafStream(1); }}},
        {"index must be specified for lookup in indexed group",
         {[&] { constList.GetStream(KFS_StreamID(Name("opacity"))); },
          [&] { list.GetEditableStream(KFS_StreamID()); }}},
        {"stream at index has wrong matchname",
         {[&] { constList.GetStream(KFS_StreamID(0, Name("node"))); },
          [&] { list.GetEditableStream(KFS_StreamID(0, Name("node"))); },
          [&] { constNode.GetStream(KFS_StreamID(2, Name("rotation"))); },
          [&] { node->GetEditableStream(KFS_StreamID(2, Name("rotation"))); }}},
        {"child not found in parent", {[&] { list.SlowGetIDOfChild(x.get()); }}},
        {"invalid index in named group",
         {[&] { node->GetStream(4); }, [&] { node->GetEditableStreamNullOK(4); },
          [&] { constNode.GetStream(KFS_StreamID(4)); }, [&] { node->GetEditableStream(KFS_StreamID(4)); },
          [&] { node->GetEditableStream(KFS_StreamID(0xFFFFFFFE, Name("position"))); }}},
        {"unexpected match name searched for in group",
         {[&] { constNode.GetStream(KFS_StreamID(Name("scale"))); }, [&] { constNode.GetStream(KFS_StreamID()); },
          [&] { node->GetEditableStream(KFS_StreamID(Name("scale"))); },
          [&] { node->GetEditableStream(KFS_StreamID()); }, [&] { node->IsModifiedByName(Name("scale")); }}},
        {"match name isn't in UI layout", {[&] { node->GetIndexInUILayout(Name("scale")); }}},
        {"expected group", {[&] { list.FindStream(KFS_StreamIDPath(0, 0)); }}},
        {"asked a property without a factory for a property type",
         {[&] { homeless.CreateStream(Name("opacity"), true, 600, false, false); }}},
    };
    for (auto const& row : rows)
        for (auto const& question : row.questions) ExpectBroken(reports, row.text, question);
    EXPECT_FALSE(node->IsModified());
    EXPECT_EQ(nullptr, node->GetStream(Name("scale"), false)) << "an unknown name may be asked for";
}

TEST_F(Groups, AKindThatWantsItGetsItsDefaultAgainOnceItIsStored)
{
    for (bool const wants : {true, false}) {
        TestLeaf::needsReset = wants;
        auto const node = MakeNode();
        EXPECT_EQ(wants ? 2 : 1, static_cast<TestLeaf*>(node->GetEditableStream(Name("rotation")))->defaultKeys);
    }
}

TEST_F(Groups, ACanonicalEntryOfAListStaysTheFactorys)
{
    auto* const canonical = Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"));
    {
        TestRoot<TestIndexedGroup> list("layers");
        Q_ScAutoPtr<KFS_StreamBase> entry(canonical);
        list.AppendStream(&entry);
        EXPECT_EQ(canonical, list.GetEditableStream(0u)) << "there is no upgrade here";
        EXPECT_EQ(canonical, list.GetEditableStreamNullOK(0u));
        EXPECT_EQ(&list, canonical->GetParent());
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        EXPECT_FALSE(list.DuplicateStream(0)->IsCanonical());
        delete list.RemoveStream(1);
        EXPECT_EQ(before.blocks, Q_MemoryLive(nullptr).blocks) << "a duplicate is the list's own";
        EXPECT_EQ(canonical, Clone(list)->GetAsIndexedGroup()->GetStream(0)) << "a clone shares it";
    }
    EXPECT_EQ(nullptr, canonical->GetParent()) << "it outlives the list, and forgets it";
    EXPECT_TRUE(canonical->IsCanonical());
}

TEST_F(Groups, ManyThreadsFindACanonicalGroupComplete)
{
    for (int round = 0; round < 20; ++round) {
        TestKinds more;
        std::vector<KFS_MatchName> names;
        for (int i = 0; i < 40; ++i) {
            names.push_back(Name(("kind " + std::to_string(i)).c_str()));
            more.Leaf(reinterpret_cast<char const*>(names.back().GetName()), 1, i);
        }
        more.Named("crowd", names);
        auto const* const crowd = Canonical("crowd")->GetAsNamedGroup();
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

TEST_F(Groups, NoFailedAllocationLeavesAnythingBehindOrASlotEmpty)
{
    struct Scene {
        TestRoot<TestIndexedGroup> list{"layers"};
        KFS_NamedStreamGroup* node = AddNode(list);
        KFS_StreamBase* anchor =
            node->GetEditableStream(Name("transform"))->GetAsNamedGroup()->GetEditableStream(Name("anchor"));
    };
    const std::function<void(Scene&)> edits[] = {
        [](Scene&) { MakeNode(); },
        [](Scene& s) { Clone(s.list); },
        [](Scene& s) { s.node->GetEditableStream(Name("position")); },
        [](Scene& s) { s.node->ResetAllStreamsToCanonical(true); },
        [](Scene& s) { delete (s.list.DuplicateStream(0), s.list.RemoveStream(1)); },
        [](Scene& s) { s.list.ReorderStreams(0, 0); },
    };
    int failures = 0;
    for (auto const& edit : edits) {
        failures +=
            FailEveryAllocation([] { return std::make_unique<Scene>(); }, AtBoundary([&](Scene& s) { edit(s); }),
                                [&](Scene& s, int, Q_MemoryCount const& before) {
                                    bool const isAsBefore = !s.node->GetEditableStreamNullOK(Name("position"));
                                    EXPECT_TRUE(!isAsBefore || Q_MemoryLive(nullptr).blocks <= before.blocks);
                                    EXPECT_TRUE(!isAsBefore || Q_MemoryLive(nullptr).bytes <= before.bytes + 64)
                                        << "but for a list's vector, which may have grown";
                                    reports.Take();
                                    EXPECT_EQ(1u, s.list.GetNumStreams());
                                    EXPECT_EQ(SceneOrder, NamesOf(*s.node));
                                    EXPECT_FALSE(s.node->GetEditableStream(Name("transform"))->IsCanonical());
                                });
    }
    EXPECT_LT(20, failures);
}

// The host may rename what it has, and a listener may make something real in a group that is about to die.
TEST_F(Groups, TheEndOfAGroupTakesAllWithIt)
{
    MakeNode();  // fills canonical groups in
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (bool const isListening : {false, true}) {
        TestRoot<TestIndexedGroup> root("layers");
        NotificationRecorder recorder;
        auto* const node = AddNode(root);
        for (char const* const name : {"opacity", "position", "rotation"}) node->GetEditableStream(Name(name));
        if (isListening) {
            recorder.look = [&](KFS_StreamGroup* group, KFS_StreamBase const*) -> std::string {
                if (group != node || !recorder.Current().starts_with("before-remove")) return {};
                node->GetEditableStream(Name("opacity"));
                node->GetEditableStream(Name("rotation"));
                return {};
            };
            delete root.RemoveStream(0);
            recorder.look = {};
        } else {
            node->GetEditableStream(Name("opacity"))->SetMatchName(Name("position"));
            node->GetEditableStream(Name("rotation"))->SetMatchName(Name("no kind"));
            recorder.Take();
            node->ResetAllStreamsToCanonical(false);
            EXPECT_EQ(SceneOrder, NamesOf(*node));
            Notifications const heard = recorder.Take();
            EXPECT_EQ(4, std::count_if(heard.begin(), heard.end(),
                                       [](std::string const& s) { return s.starts_with("after-remove node "); }));
        }
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

TEST_F(Groups, ACanonicalGroupFollowsEachNewLayout)
{
    Growing::kindCount = 1;
    kinds.Group<Growing>("growing", {});
    auto const* const group = Canonical("growing")->GetAsNamedGroup();
    group->EnsureUILayoutComplete();
    EXPECT_EQ(Names{"opacity"}, NamesOf(*group));
    // Nobody looks at the layouts between, so the last one may lie where the first did.
    for (Growing::kindCount = 2; Growing::kindCount < 4; ++Growing::kindCount)
        Get_VX_StreamFactory()->SetupCanonicalStream(Name("growing"));
    EXPECT_EQ(0u, group->GetNumStreams()) << "filled in when somebody looks";
    EXPECT_EQ("scale", NameOf(group->GetStream(2)));
    EXPECT_EQ((Names{"opacity", "rotation", "scale"}), NamesOf(*group));
}

// A name of bytes of which many begin alike, since no texts with such hashes are known.
KFS_MatchName RandomName(Dice& dice)
{
    std::array<unsigned char, 16> bytes{};
    bytes[0] = dice.Below(2) == 0 ? 0x7F : 0x80;
    bytes[7] = static_cast<unsigned char>(dice.Below(2));
    bytes[8] = static_cast<unsigned char>(dice.Bits());
    bytes[15] = static_cast<unsigned char>(dice.Below(3));
    KFS_MatchName name;
    name.SetGuid(Guid(bytes));
    return name;
}

TEST_F(Groups, ALayoutKnowsWhereEachNameStands)
{
    Dice dice(23);
    for (std::size_t const size : {0u, 1u, 2u, 3u, 64u, 99u, 700u}) {
        SCOPED_TRACE(size);
        // Drawn in no order, and sorted by the bytes of their names.
        std::vector<std::unique_ptr<KFS_StreamBase>> nodes;
        std::map<std::array<unsigned char, 16>, unsigned int> positions;
        std::vector<unsigned int> groups;
        KFS_CanonicalLayout layout;
        while (nodes.size() < size) {
            KFS_MatchName const name = RandomName(dice);
            auto const position = static_cast<unsigned int>(nodes.size());
            if (!positions.emplace(name.GetGuid().GuidToBytes(), position).second) continue;
            bool const isGroup = dice.Below(4) == 0;
            nodes.push_back(isGroup ? std::unique_ptr<KFS_StreamBase>(new BareGroup) : MakeStream());
            nodes.back()->SetMatchName(name);
            layout.push_back(nodes.back().get());
            if (isGroup) groups.push_back(position);
        }
        KFSp_LayoutOrder const order(layout);
        ASSERT_EQ(size, order.Slots().size());
        EXPECT_EQ(groups, order.Subgroups());
        for (unsigned int slot = 0; auto const& [bytes, position] : positions) {
            EXPECT_EQ(layout[position], order.Slots()[slot]);
            EXPECT_TRUE(order.SlotOf(position) == slot && order.PositionOf(slot) == position);
            EXPECT_EQ(slot++, order.Find(layout[position]->GetMatchName()));
        }
        for (int i = 0; i < 1000; ++i) {
            KFS_MatchName const name = RandomName(dice);
            ASSERT_EQ(positions.contains(name.GetGuid().GuidToBytes()), order.Find(name) != KFSp_LayoutOrder::None);
        }
    }
}

}  // namespace
