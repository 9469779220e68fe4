#include "tests/support/baregroup.h"
#include "tests/support/notifications.h"
#include "tests/support/text.h"
#include "tree/listener_private.h"

#include "keystore/attributes.h"

#include <stdexcept>
#include <thread>

// What each node has, and who hears of its changes.

namespace {

// A root that holds children without owning them, so that a test can build any tree.
class Group : public BareGroup {
public:
    void Store(KFS_StreamBase* child)
    {
        children_.push_back(child);
        child->SetParent(this);
    }
    unsigned int GetNumStreams() const override { return static_cast<unsigned int>(children_.size()); }
    KFS_StreamBase const* GetStream(unsigned int index) const override { return children_[index]; }
    KFS_Project* GetProject() const override { return project; }
    int ProbeListenerState() override { return ++probes, KFS_ListenerState_Heard; }
    void NotifyStreamStored(KFS_StreamGroup* group, KFS_StreamBase* stream) override
    {
        stored.push_back({group, stream});
        if (KFS_StreamBase* const child = std::exchange(alsoStore, nullptr)) Store(child);
    }

    std::vector<std::pair<KFS_StreamGroup*, KFS_StreamBase*>> stored;
    KFS_StreamBase* alsoStore = nullptr;
    KFS_Project* project = nullptr;
    int probes = 0;

private:
    std::vector<KFS_StreamBase*> children_;
};

class Nodes : public SceneTest {
protected:
    Group root;
    NotificationRecorder recorder;
};

TEST_F(Nodes, HaveFlags)
{
    using B = KFS_StreamBase;
    struct {
        void (B::*set)(bool);
        bool (B::*get)() const;
        unsigned int bit;
    } const rows[] = {
        {&B::SetActive, &B::IsActive, 0x1},
        {&B::SetHidden, &B::IsHidden, 0x2},
        {&B::SetCanonical, &B::IsCanonical, 0x4},
        {&B::ShowActiveSwitch, &B::IsShowingActiveSwitch, 0x8},
        {&B::SetDisabled, &B::IsDisabled, 0x10},
        {&B::SetElided, &B::IsElided, 0x20},
        {&B::MakeIndependent, &B::IsIndependent, 0x40},
        {&B::SetMarkedGraph, &B::IsMarkedGraph, 0x200},
        {&B::SetShownWhenEmpty, &B::IsShownWhenEmpty, 0x400},
        {&B::SetDimensionsSeparated, &B::AreDimensionsSeparated, 0x800},
        {&B::SetAffectsRenderingWhenHidden, &B::AffectsRenderingWhenHidden, 0x1000},
        {&B::SetAddedDStream, &B::IsAddedDStream, 0x20000},
        {&B::SetNamesSameInitted, &B::NamesSameInitted, 0x40000},
        {&B::SetNamesSame, &B::NamesSame, 0x80000},
    };
    TestStream const stream;
    B* const base = stream.get();
    EXPECT_EQ(1u, base->GetStreamBaseFlags());
    EXPECT_EQ(FX_Param_NotFilledIn, base->GetParamDef().paramType);
    EXPECT_TRUE(base->AreDimensionsConstrained());
    base->SetDimensionsConstrained(false);
    EXPECT_EQ(0x2001u, base->GetStreamBaseFlags());
    for (auto const& row : rows) {
        for (bool const on : {true, false}) {
            SCOPED_TRACE(testing::Message() << std::hex << row.bit << " " << on);
            base->SetStreamBaseFlags(on ? 0 : 0xFFFFFFFF, 0xFFFFFFFF);
            (base->*row.set)(on);
            EXPECT_EQ(on ? row.bit : ~row.bit, base->GetStreamBaseFlags());
            EXPECT_EQ(on, (base->*row.get)());
        }
    }
    base->MakeIndependent(false);
    {
        KFS_ScSetResetIndependent const outer(base, true);
        EXPECT_TRUE(base->IsIndependent());
        KFS_ScSetResetIndependent const inner(base, true);
        base->MakeIndependent(false);
    }
    EXPECT_FALSE(base->IsIndependent());
    EXPECT_EQ(5u, KFS_Stream(1, 600, 0, 0, 7, 0, {}, nullptr, nullptr, true).GetStreamBaseFlags());
}

TEST_F(Nodes, AreStoredOnceAndKnowTheirProject)
{
    using Pairs = std::vector<std::pair<KFS_StreamGroup*, KFS_StreamBase*>>;
    kfshost::Project other;
    Group middle;
    TestStream const leaf, second;
    root.project = &other;
    root.Store(&middle);
    root.stored.clear();
    root.alsoStore = second;  // stores a further stream from inside the notification
    middle.Store(leaf);
    EXPECT_EQ((Pairs{{&middle, leaf.get()}}), middle.stored);
    EXPECT_EQ((Pairs{{&middle, leaf.get()}}), root.stored) << "no notification from inside one";
    EXPECT_EQ(&root, second->GetParent());
    for (bool const isCanonical : {false, true}) {
        leaf->SetCanonical(isCanonical);
        KFS_Project* const expected = isCanonical ? &session.GetProject() : &other;
        EXPECT_EQ(expected, KFS_GetProject(leaf, false));
        EXPECT_EQ(expected, KFS_GetConstProject(static_cast<KFS_Stream const*>(leaf), true));
    }
}

// A comparison is a change of flags: the answer first, then that it holds. A name that is filled in is no news.
TEST_F(Nodes, CompareTheirNamesOnDemand)
{
    TestStream const leaf;
    root.Store(leaf);
    leaf->SetMatchName(Name("scale"));
    EXPECT_EQ(Text("scale"), leaf->GetMatchName16Str());
    leaf->SetMatchName(Name("blur"));
    EXPECT_EQ(Text("blur"), leaf->GetMatchName16Str());
    leaf->pSetDisplayName(Text("blur"));
    EXPECT_EQ(Notifications{}, recorder.Take());
    for (int i = 0; i < 2; ++i) EXPECT_TRUE(leaf->IsMatchNameSameAsDisplayName());
    EXPECT_EQ((Notifications{"flags blur 1 524289", "flags blur 524289 786433"}), recorder.Take());
    leaf->pSetDisplayName(Text("Blur"));
    EXPECT_EQ(Notifications{}, recorder.Take());
    EXPECT_EQ(0x80001u, leaf->GetStreamBaseFlags()) << "the answer stands, but no longer holds";
    EXPECT_FALSE(leaf->IsMatchNameSameAsDisplayName());
    leaf->SetMatchName(Name("Blur"));
    EXPECT_TRUE(leaf->IsMatchNameSameAsDisplayName());
    EXPECT_THROW(leaf->SetEnglishDisplayName(Text("x")), std::logic_error);
}

TEST_F(Nodes, AreHeardWhereTheirRootIs)
{
    {
        TestStream const leaf({.spatial = true}), canonical;
        leaf->SetHidden(true);
        EXPECT_EQ(KFS_ListenerState_Unknown, leaf->GetListenerState()) << "without a parent the answer stays open";
        canonical->SetCanonical(true);
        EXPECT_EQ(KFS_ListenerState_Silent, canonical->ProbeListenerState());
        EXPECT_EQ(Notifications{}, recorder.Take());
        root.Store(leaf);
        leaf->SetHidden(false);
        leaf->NotifyValueChanged();
        EXPECT_EQ(1, root.probes) << "asked once";
        EXPECT_EQ((Notifications{"flags  3 1", "value "}), recorder.Take());
        Q_SetRunMode(Q_RunMode_Silent);
        leaf->NotifyValueChanged();
        Q_SetRunMode(0);
        leaf->SetCanonical(true);
        leaf->NotifyValueChanged();
        leaf->SetCanonical(false);
        leaf->SetStreamBaseFlags(0xFFFFFFFF, 0);
        double old[4];
        EXPECT_EQ(0, KFS_SetStreamMultiplier(leaf, nullptr, old));
        EXPECT_EQ(Notifications{}, recorder.Take());
    }
    EXPECT_EQ(Notifications{"destroyed "}, recorder.Take());
}

TEST_F(Nodes, DieWhateverListenersThrow)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    for (bool const isInt : {true, false}) {
        {
            TestStream const leaf;
            root.Store(leaf);
            recorder.look = [isInt](KFS_StreamGroup*, KFS_StreamBase const*) -> std::string {
                if (isInt) throw int{77};
                throw std::runtime_error("the panel is gone");
            };
        }
        recorder.look = {};
        EXPECT_EQ(Notifications{"destroyed "}, recorder.Take());
        std::vector<Reported> const seen = reports.Take();
        EXPECT_TRUE(isInt ? seen.empty() : seen.size() == 1 && seen[0].text == "the panel is gone");
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

using Listeners = SceneTest;

TEST_F(Listeners, HearTheirThreadsUnlessThesePauseOrOneFails)
{
    NotificationRecorder anywhere, mainOnly;
    mainOnly.mainThreadOnly = true;
    TestRoot<TestIndexedGroup> root("layers");
    Q_ScAutoPtr<KFS_StreamBase> a = TestKinds::Make("opacity");
    root.AppendStream(&a);
    auto const expectHeard = [&](std::size_t everywhere, std::size_t onMain) {
        EXPECT_EQ(everywhere, anywhere.Take().size());
        EXPECT_EQ(onMain, mainOnly.Take().size());
    };
    expectHeard(2, 2);
    bool was = true, other = false;
    EXPECT_EQ(0, KFS_PauseMainListener(true, was));
    EXPECT_FALSE(was);
    root.ReorderStreams(0, 0);
    expectHeard(0, 0);
    std::thread([&] {
        bool inside = true;
        EXPECT_EQ(0, KFS_PauseMainListener(false, inside));
        EXPECT_FALSE(inside) << "a thread begins unpaused";
        root.ReorderStreams(0, 0);
    }).join();
    expectHeard(2, 0);
    EXPECT_EQ(0, KFS_PauseMainListener(was, other));
    EXPECT_TRUE(other) << "the reorder left the pause that it found";
    EXPECT_EQ(0, KFS_RegisterMainListener(&anywhere)) << "which it is";
    root.SetHidden(true);
    expectHeard(1, 1);
    for (int i = 0; i < 2; ++i) EXPECT_EQ(0, KFS_UnregisterMainListener(&anywhere)) << "an unknown one is passed over";
    root.SetHidden(false);
    expectHeard(0, 1);
    EXPECT_EQ(0, KFS_RegisterMainListener(&anywhere));
    bool const isFirst = &anywhere < &mainOnly;
    (isFirst ? anywhere : mainOnly).ThrowAt("");
    EXPECT_EQ(77, KFSp_Boundary([&] { root.ReorderStreams(0, 0); }));
    expectHeard(isFirst ? 1 : 0, isFirst ? 0 : 1);  // a failure ends the others' turn
    anywhere.look = mainOnly.look = {};
}

// What is told, as a call that counts how often it is put into the form that listeners get.
struct CountedCall {
    explicit CountedCall(int& copies) : copies_(&copies) {}
    CountedCall(CountedCall const& other) : copies_(other.copies_) { ++*copies_; }
    void operator()(KFS_StreamListener*) const {}

private:
    int* copies_;
};

TEST_F(Listeners, CostNothingInATreeThatTheyDontHear)
{
    TestRoot<TestIndexedGroup> heard("layers");
    EXPECT_NO_THROW(KFS_NotifyListeners(&heard, KFS_Notification())) << "nobody listens";
    NotificationRecorder const recorder;
    EXPECT_THROW(KFS_NotifyListeners(&heard, KFS_Notification()), boost::bad_function_call);
    auto const silent = MakeNode();
    int copies = 0;
    KFSp_Notify(silent.get(), CountedCall(copies));
    EXPECT_EQ(0, copies);
    KFSp_Notify(&heard, CountedCall(copies));
    EXPECT_NE(0, copies);
    auto* const opacity = silent->GetEditableLeafStream(Name("opacity"));
    Q_FailAllocation(1);
    opacity->SetHidden(true);
    opacity->NotifyValueChanged();
    Q_ScAutoPtr<KFS_StreamBase> const left(silent->SwapCanonicalForStream(Name("opacity")));
    EXPECT_FALSE(Q_FailAllocationFired());
    Q_FailAllocation(0);
    EXPECT_EQ(opacity, left.get());
}

}  // namespace
