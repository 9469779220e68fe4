#include "tree/streamgroup.h"

#include "keystore/paramstreams.h"
#include "tests/persist/treefile.h"
#include "tests/support/notifications.h"

#include <limits>

namespace {

using Lines = std::vector<std::string>;

// A parameter that isn't its canonical one's is in the file, though the value is: another name, another end of a
// slider's range, where a NaN differs even from itself.
TEST_F(Tree, ParametersThatDifferAreWritten)
{
    float const nan = std::numeric_limits<float>::quiet_NaN();
    struct {
        int kind;
        char initial;
        float low, high, canonicalLow, canonicalHigh;
        bool isWritten;
    } const cases[] = {
        {FX_Param_FLOAT_SLIDER, 0, 0, 10, 0, 10, false},  {FX_Param_FLOAT_SLIDER, 0, -1, 10, 0, 10, true},
        {FX_Param_FLOAT_SLIDER, 0, 1, 10, 0, 10, true},   {FX_Param_FLOAT_SLIDER, 0, 0, 9, 0, 10, true},
        {FX_Param_FLOAT_SLIDER, 0, 0, 11, 0, 10, true},   {FX_Param_FLOAT_SLIDER, 0, nan, 10, 0, 10, true},
        {FX_Param_FLOAT_SLIDER, 0, 0, nan, 0, 10, true},  {FX_Param_FLOAT_SLIDER, 0, 0, 10, nan, 10, true},
        {FX_Param_FLOAT_SLIDER, 0, 0, nan, 0, nan, true}, {FX_Param_ALWAYS_SAVED, 0, 0, 0, 0, 0, true},
        {FX_Param_COLOR, 'p', 0, 0, 0, 0, true}};
    for (auto const& c : cases) {
        SCOPED_TRACE(testing::Message() << c.kind << ' ' << c.low << ' ' << c.high << ' ' << c.canonicalLow << ' '
                                        << c.canonicalHigh);
        FX_ParamDef def{};
        def.paramType = c.kind;
        def.value.floatSlider.sliderMin = c.canonicalLow;
        def.value.floatSlider.sliderMax = c.canonicalHigh;
        Get_VX_StreamFactory()->GetCanonicalStream(Name("opacity"))->SetParamDef(def);
        auto const node = MakeNode();
        def.name[0] = c.initial;
        def.value.floatSlider.sliderMin = c.low;
        def.value.floatSlider.sliderMax = c.high;
        node->GetEditableStream(Name("opacity"))->SetParamDef(def);
        Lines const expected = c.isWritten ? Lines{"opacity", "transform"} : Lines{"transform"};
        EXPECT_EQ(expected, NamesIn(WrittenGroup(node.get())));
    }
}

// A layer is in the file whatever it is, and a child may be saved under another name. What old files don't know is left out.
class Matte : public KFS_ParamLayerStream {
public:
    using KFS_ParamLayerStream::KFS_ParamLayerStream;
    bool IsModified() const override { return false; }
    KFS_MatchName GetMatchNameOverrideForSave(CKF_File const* file) const override
    {
        return file->majorVersion < 90 ? Name("old matte") : KFS_ParamLayerStream::GetMatchNameOverrideForSave(file);
    }
};

TEST_F(Tree, WhatIsWrittenGoesByKindAndVersion)
{
    auto const layers = MakeLayers();
    FX_ParamDef def{};
    def.paramType = FX_Param_POINT_3D;
    Append(layers.get(), "opacity")->SetParamDef(def);
    EXPECT_EQ((Lines{"opacity"}), NamesIn(WrittenGroup(layers.get(), 77)));
    EXPECT_EQ((Lines{}), NamesIn(WrittenGroup(layers.get(), 76)));
    KFS_AppCallbacks callbacks{};
    callbacks.layerDefaultValueFunc = [](KFS_ParamLayerStream const*) -> void* { return nullptr; };
    callbacks.layerIndependentFunc = [](KFS_ParamLayerStream const*, bool) { return 0L; };
    KFS_SetCallbacks(callbacks);
    KFS_ScRegisterStreams batch(Get_VX_StreamFactory());
    batch.Register(
        Name("matte"),
        [](KFS_MatchName const& name, KFS_StreamFactory* factory, bool, unsigned int scale, bool canonical) {
            return new Matte(scale, 1, &name, factory, canonical);
        },
        false);
    {
        TestKinds more;
        more.Named("cut", {Name("opacity"), Name("matte")});
        Q_ScAutoPtr<KFS_StreamBase> const cut = TestKinds::Make("cut");
        KFS_StreamGroup* const group = cut->GetAsGroup();
        EXPECT_EQ((Lines{}), NamesIn(WrittenGroup(group))) << "not while it is shared";
        group->GetEditableStream(1);
        EXPECT_EQ((Lines{"matte"}), NamesIn(WrittenGroup(group)));
        EXPECT_EQ((Lines{"old matte"}), NamesIn(WrittenGroup(group, 89)));
    }
    batch.UnregisterAll();
    KFS_ClearCallbacks();
}

// A group whose children may be missing from its type one day.
class OpenGroup : public TestNamedGroup {
public:
    using TestNamedGroup::TestNamedGroup;
    bool CouldGoMissing() const override { return true; }
};

// What the file says of a child's name in each kind of place, and which name a child has that the file calls "Fade".
TEST_F(Tree, Names)
{
    auto const nameIn = [](KFS_StreamBase const* child) { return DataOf("kfsn", Written(child->GetAsLeaf())); };
    auto const layers = MakeLayers();
    auto const node = MakeNode();
    OpenGroup open(Name("node"), Get_VX_StreamFactory(), false, {});
    // A host may put a stream into a list that it has made without a factory.
    Q_ScAutoPtr<KFS_StreamBase> stray(new TestLeaf(Name("opacity"), nullptr, true, 600U, false, short{1}, 0.0));
    Q_ScAutoPtr<KFS_StreamBase> const root = TestKinds::Make("opacity");
    KFS_StreamBase* const inStray = stray.get();
    KFS_StreamBase* const unheard = Append(layers.get(), "opacity");
    layers->AppendStream(&stray);
    struct {
        KFS_StreamBase* child;
        std::string untouched, renamed, ofNoKind;  // without a canonical one
    } const rows[] = {{node->GetEditableStream(Name("opacity")), Marker, Marker, Marker},
                      {open.GetEditableStream(Name("opacity")), "opacity", "Fade", "Fade"},
                      {unheard, Marker, "Fade", Marker},
                      {inStray, Marker, Marker, Marker},
                      {root.get(), "opacity", "Fade", "Fade"}};
    for (auto const& row : rows) {
        SCOPED_TRACE(&row - rows);
        EXPECT_EQ(row.untouched, nameIn(row.child));
        row.child->SetDisplayName(Text("Fade"));
        EXPECT_EQ(row.renamed, nameIn(row.child));
        row.child->SetMatchName(Name("unheard of"));
        EXPECT_EQ(row.ofNoKind, nameIn(row.child));
        row.child->SetMatchName(Name("opacity"));
    }

    KFS_ScRegisterStreams batch(Get_VX_StreamFactory());
    batch.Register(
        Name("foreign"),
        [](KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int scale, bool canonical) {
            auto leaf = std::make_unique<TestLeaf>(name, factory, constant, scale, canonical, short{1}, 0.0);
            leaf->pSetDisplayName(u16str());
            return leaf.release();
        },
        false);
    {
        TestKinds more;
        more.Named("plug-in", {Name("opacity"), Name("foreign")});
        for (char const* const kind : {"opacity", "foreign"}) {
            for (bool const couldGoMissing : {false, true}) {
                OpenGroup missing(Name("plug-in"), Get_VX_StreamFactory(), false, {});
                Q_ScAutoPtr<KFS_StreamBase> const closed = TestKinds::Make("plug-in");
                KFS_StreamGroup* const group = couldGoMissing ? &missing : closed->GetAsGroup();
                ASSERT_EQ(0, ReadGroup(group, Form(Group("Top", MatchName(kind) + OneLeaf("Fade", 1.0)))));
                KFS_StreamBase const* const child = group->GetAsNamedGroup()->GetStream(Name(kind), true);
                EXPECT_EQ(1.0, ValueOf(child));
                bool const hasName = child->GetMatchName() == Name("opacity");
                EXPECT_EQ(Text(hasName ? "opacity" : couldGoMissing ? "Fade" : ""), child->GetDisplayName());
            }
        }
    }
    batch.UnregisterAll();
}

TEST_F(Tree, UnknownChildren)
{
    std::string const file =
        Form(Group("", MatchName("from elsewhere") + List("kfgp", MatchName("opacity") + OneLeaf("", 9.0) + End) +
                           Atom("what", "?") + MatchName("opacity") + OneLeaf("", 7.0)));
    auto const node = MakeNode();
    ASSERT_EQ(0, ReadGroup(node.get(), file));
    EXPECT_EQ(7.0, ValueOf(node->GetStream(0)));
    auto const layers = MakeLayers();
    EXPECT_EQ(KFS_Err_UnknownStream, ReadGroup(layers.get(), file));
    EXPECT_EQ(1u, reports.Take().size());
    EXPECT_EQ(0u, layers->GetNumStreams());
    // Known, but not here.
    std::string const misplaced =
        Form(Group("", MatchName("scale") + OneLeaf("", 1.0, 2) + MatchName("opacity") + OneLeaf("", 7.0)));
    ASSERT_EQ(0, ReadGroup(node.get(), misplaced));
    EXPECT_EQ(7.0, ValueOf(node->GetStream(0)));
    EXPECT_EQ(3, ReadGroup(layers.get(), misplaced));
    EXPECT_EQ(1u, reports.Take().size());
}

// A child that its group doesn't have any more is read and handed over.
class Upgrader : public TestNamedGroup {
public:
    using TestNamedGroup::TestNamedGroup;
    void UpgradeChildStream(KFS_StreamBase* obsolete) override
    {
        upgraded.emplace_back(NameOf(obsolete), ValueOf(obsolete));
        EXPECT_EQ(nullptr, obsolete->GetParent());
    }
    std::vector<std::pair<std::string, double>> upgraded;
};

TEST_F(Tree, ObsoleteChildrenAreHandedOver)
{
    Upgrader group(Name("node"), Get_VX_StreamFactory(), false, {});
    ASSERT_EQ(0, ReadGroup(&group, Form(Group("", MatchName("scale") + OneLeaf("", 8.0, 2) + MatchName("opacity") +
                                                      OneLeaf("", 7.0)))));
    EXPECT_EQ((std::vector<std::pair<std::string, double>>{{"scale", 8.0}}), group.upgraded);
}

TEST_F(Tree, WithoutAGroupNothingChanges)
{
    auto const layers = MakeLayers();
    Append(layers.get(), "opacity");
    std::pair<std::string, int> const rows[] = {
        {OneLeaf("", 1.0), 0},
        {List("kfgp", BaseNamed(Marker)), CKF_Err_NoSuchChunk},  // no end
        {List("kfgp", End), CKF_Err_NoSuchChunk},                // no flags
        {List("kfgp", Atom("kfsb", Long(1)) + End), 0},          // the name may be missing
        {Group(Marker, ""), 0},
    };
    for (auto const& [file, code] : rows) {
        EXPECT_EQ(code, ReadGroup(layers.get(), Form(file)));
        EXPECT_EQ(Text("layers"), layers->GetDisplayName());
        EXPECT_EQ(1u, layers->GetNumStreams());
    }
}

// Bits that say nothing about the project stay what they were.
TEST_F(Tree, FlagsOfAFile)
{
    for (unsigned const before : {0x1u, 0xFFFFFFFBu}) {
        for (unsigned const stored : {0u, 0xFFFFFFFFu, 0x12345678u}) {
            auto const layers = MakeLayers();
            layers->SetStreamBaseFlags(before, 0xFFFFFFFB);
            ASSERT_EQ(0, ReadGroup(layers.get(), Form(List("kfgp", Atom("kfsb", Long(stored)) + End))));
            EXPECT_EQ((stored & 0xFFFE2F13) | (before & 0x1D0EC), layers->GetStreamBaseFlags());
        }
    }
}

// Files that are older than the flags, and older than the names.
TEST_F(Tree, OldFiles)
{
    std::string const plain = List("kfgp", End);
    std::string const full = List("kfgp", BaseNamed("Named", KFS_BaseFlag_Hidden) + End);
    struct {
        std::uint32_t major;
        std::string const& file;
        bool flags, name;
    } const cases[] = {
        {55, plain, false, false}, {55, full, false, false}, {56, full, true, false}, {57, full, true, true}};
    for (auto const& c : cases) {
        SCOPED_TRACE(c.major);
        auto const layers = MakeLayers();
        ASSERT_EQ(0, ReadGroup(layers.get(), Form(c.file, c.major)));
        EXPECT_EQ(c.flags, layers->IsHidden());
        EXPECT_EQ(!c.flags, layers->IsActive());
        EXPECT_EQ(Text(c.name ? "Named" : "layers"), layers->GetDisplayName());
    }
}

class Follower : public KFS_Stream {
public:
    Follower() : KFS_Stream(1, 600, 1, 0, KFS_InterpMask_All, 0, {.dataType = KFS_Type_Double}, nullptr, nullptr, false)
    {}
    bool IsSeparationFollower() const override { return true; }
};

TEST_F(Tree, FollowersOfOldFilesAreActive)
{
    std::string const leaf =
        List("kfbs", BaseNamed("", 0) + Atom("kfb4", LeafRecord()) + Atom("cdat", std::string(40, '\0')));
    for (std::uint32_t const major : {81u, 82u}) {
        Follower stream;
        EXPECT_EQ(0, ReadLeaf(&stream, Form(leaf, major)));
        EXPECT_EQ(major == 81, stream.IsActive());
        TestStream other;
        EXPECT_EQ(0, ReadLeaf(other, Form(leaf, major)));
        EXPECT_FALSE(other->IsActive());
    }
}

// The child stands in the tree when it reads, so what it reads is heard.
TEST_F(Tree, ALoadIsHeard)
{
    NotificationRecorder recorder;
    TestRoot<TestNamedGroup> root("node");
    recorder.Label(&root, "root");
    static_cast<void>(recorder.Take());
    ASSERT_EQ(0, ReadGroup(&root, Form(List("kfgp", BaseNamed("node") + MatchName("opacity") +
                                                        List("kfbs", BaseNamed(Marker, 3) + Atom("kfb4", LeafRecord()) +
                                                                         Atom("cdat", std::string(40, '\0'))) +
                                                        End))));
    EXPECT_EQ(
        (Notifications{"name root", "before-swap root opacity 0", "after-swap root opacity 0", "flags opacity 1 3"}),
        recorder.Take());
}

}  // namespace
