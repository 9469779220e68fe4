#include "tree/streambase.h"

#include "tests/support/baregroup.h"
#include "tests/support/notifications.h"
#include "tests/support/text.h"

#include <stdexcept>

namespace {

// A group that holds children without owning them, so that a test can build any tree.
class Group : public BareGroup {
public:
    explicit Group(unsigned int timeScale = 0) : timeScale_(timeScale) {}
    void Store(KFS_StreamBase* child)
    {
        children_.push_back(child);
        child->SetParent(this);
    }
    unsigned int GetNumStreams() const override { return static_cast<unsigned int>(children_.size()); }
    KFS_StreamBase const* GetStream(unsigned int index) const override { return children_[index]; }
    unsigned int GetPreferredTimeScale() const override
    {
        return timeScale_ ? timeScale_ : KFS_StreamGroup::GetPreferredTimeScale();
    }
    void NotifyStreamStored(KFS_StreamGroup* group, KFS_StreamBase* stream) override
    {
        stored.push_back({group, stream});
        if (alsoStore) {
            KFS_StreamBase* const child = std::exchange(alsoStore, nullptr);
            Store(child);
        }
    }

    std::vector<std::pair<KFS_StreamGroup*, KFS_StreamBase*>> stored;
    KFS_StreamBase* alsoStore = nullptr;

private:
    std::vector<KFS_StreamBase*> children_;
    unsigned int timeScale_;
};

class ProjectRoot : public Group {
public:
    explicit ProjectRoot(KFS_Project* project) : project_(project) {}
    KFS_Project* GetProject() const override { return project_; }

private:
    KFS_Project* project_;
};

class HeardRoot : public Group {
public:
    int ProbeListenerState() override { return ++probes, KFS_ListenerState_Heard; }
    int probes = 0;
};

class StreamBase : public StreamTest {};

TEST_F(StreamBase, ANewNodeIsActiveAndConstrained)
{
    TestStream const stream;
    EXPECT_EQ(1u, stream->GetStreamBaseFlags());
    EXPECT_TRUE(stream->AreDimensionsConstrained());
    stream->SetDimensionsConstrained(false);
    EXPECT_EQ(0x2001u, stream->GetStreamBaseFlags());
    EXPECT_EQ(FX_Param_NotFilledIn, stream->GetParamDef().paramType);
    KFS_ValueDesc desc;
    desc.dataType = KFS_Type_Double;
    EXPECT_EQ(5u, KFS_Stream(1, 600, 0, 0, 7, 0, desc, nullptr, nullptr, true).GetStreamBaseFlags());
}

TEST_F(StreamBase, FlagAccessorsHoldTheirBits)
{
    TestStream const stream;
    struct Row {
        void (KFS_StreamBase::*set)(bool);
        bool (KFS_StreamBase::*get)() const;
        unsigned int bit;
    };
    using B = KFS_StreamBase;
    Row const rows[] = {
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
    KFS_StreamBase* const base = stream.get();
    for (Row const& row : rows) {
        for (bool const on : {true, false}) {
            SCOPED_TRACE(testing::Message() << std::hex << row.bit << " " << on);
            base->SetStreamBaseFlags(on ? 0 : 0xFFFFFFFF, 0xFFFFFFFF);
            (base->*row.set)(on);
            EXPECT_EQ(on ? row.bit : ~row.bit, base->GetStreamBaseFlags());
            EXPECT_EQ(on, (base->*row.get)());
        }
    }
}

TEST_F(StreamBase, ARealStreamHasItsRootsProjectAndACanonicalOneTheCurrent)
{
    kfshost::Project other;
    ProjectRoot root(&other);
    Group middle;
    TestStream const leaf;
    root.Store(&middle);
    middle.Store(leaf);
    KFS_Stream const* const constLeaf = leaf;
    EXPECT_EQ(&other, KFS_GetProject(leaf, false));
    EXPECT_EQ(&other, KFS_GetConstProject(constLeaf, true));
    leaf->SetCanonical(true);
    EXPECT_EQ(&session.GetProject(), KFS_GetProject(leaf, false));
    EXPECT_EQ(&session.GetProject(), KFS_GetConstProject(constLeaf, true));
}

TEST_F(StreamBase, AncestorsHearOfAStoredStreamOnce)
{
    Group root, middle;
    TestStream const leaf, second;
    root.Store(&middle);
    root.stored.clear();
    root.alsoStore = second;  // stores a further stream from inside the notification
    middle.Store(leaf);
    using Pairs = std::vector<std::pair<KFS_StreamGroup*, KFS_StreamBase*>>;
    EXPECT_EQ((Pairs{{&middle, leaf.get()}}), middle.stored);
    EXPECT_EQ((Pairs{{&middle, leaf.get()}}), root.stored) << "no notification from inside one";
    EXPECT_EQ(&root, second->GetParent());
}

TEST_F(StreamBase, NamesAreFilledInOnDemandAndCompared)
{
    TestStream const stream;
    stream->SetMatchName(KFS_MatchName("scale", true));
    EXPECT_EQ(Text("scale"), stream->GetMatchName16Str());
    stream->SetMatchName(KFS_MatchName("rotation", true));
    EXPECT_EQ(Text("rotation"), stream->GetMatchName16Str());
    stream->SetDisplayName(Text("rotation"));
    EXPECT_TRUE(stream->IsMatchNameSameAsDisplayName());
    EXPECT_TRUE(stream->NamesSameInitted());
    stream->SetDisplayName(Text("Rotation"));
    EXPECT_FALSE(stream->NamesSameInitted());
    EXPECT_FALSE(stream->IsMatchNameSameAsDisplayName());
    stream->pSetDisplayName(Text("rotation"));
    EXPECT_TRUE(stream->IsMatchNameSameAsDisplayName());
    EXPECT_THROW(stream->SetEnglishDisplayName(Text("x")), std::logic_error);
}

TEST_F(StreamBase, ListenersHearOnlyTreesThatAskToBeHeard)
{
    NotificationRecorder recorder;
    HeardRoot root;
    {
        TestStream const leaf;
        leaf->SetHidden(true);
        leaf->NotifyValueChanged();
        EXPECT_EQ(KFS_ListenerState_Unknown, leaf->GetListenerState()) << "without a parent the answer stays open";
        EXPECT_EQ(Notifications{}, recorder.Take());
        TestStream const canonical;
        canonical->SetCanonical(true);
        EXPECT_EQ(KFS_ListenerState_Silent, canonical->ProbeListenerState());
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
        EXPECT_EQ(Notifications{}, recorder.Take());
    }
    EXPECT_EQ(Notifications{"destroyed "}, recorder.Take());
}

TEST_F(StreamBase, ComparedNamesAreAChangeOfFlagsAndFilledInOnesNoNews)
{
    NotificationRecorder recorder;
    HeardRoot root;
    TestStream const leaf;
    root.Store(leaf);
    leaf->SetMatchName(KFS_MatchName("blur", true));
    leaf->pSetDisplayName(Text("blur"));
    EXPECT_EQ(Notifications{}, recorder.Take());
    EXPECT_TRUE(leaf->IsMatchNameSameAsDisplayName());
    EXPECT_EQ((Notifications{"flags blur 1 524289", "flags blur 524289 786433"}), recorder.Take())
        << "the answer first, then that it holds";
    EXPECT_TRUE(leaf->IsMatchNameSameAsDisplayName());
    leaf->pSetDisplayName(Text("Blur"));
    EXPECT_EQ(Notifications{}, recorder.Take());
    EXPECT_EQ(0x80001u, leaf->GetStreamBaseFlags()) << "the answer stands, but no longer holds";
    EXPECT_FALSE(leaf->IsMatchNameSameAsDisplayName());
}

TEST_F(StreamBase, AListenersFailureDoesntKeepAStreamAlive)
{
    NotificationRecorder recorder;
    HeardRoot root;
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
        EXPECT_EQ(Notifications{"destroyed "}, recorder.Take());
        std::vector<Reported> const seen = reports.Take();
        ASSERT_EQ(isInt ? 0u : 1u, seen.size());
        if (!isInt) EXPECT_EQ("the panel is gone", seen[0].text);
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

TEST_F(StreamBase, IndependenceIsHeldForAScope)
{
    TestStream const stream;
    {
        KFS_ScSetResetIndependent const outer(stream, true);
        EXPECT_TRUE(stream->IsIndependent());
        KFS_ScSetResetIndependent const inner(stream, true);
        stream->MakeIndependent(false);
    }
    EXPECT_FALSE(stream->IsIndependent());
}

}  // namespace
