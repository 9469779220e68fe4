#include "tree/factory.h"

#include "frame/errors.h"
#include "frame/project.h"
#include "frame/services/debug.h"
#include "tests/support/groups.h"
#include "tree/decanonicalize.h"

#include <cstdlib>
#include <functional>

namespace {

using Names = std::vector<std::string>;

class Factory : public StreamTest {
protected:
    KFS_StreamFactory& factory = *Get_VX_StreamFactory();
    TestKinds kinds;
};

template <class Leaf = TestLeaf>
KFS_FactoryFunc LeafFunc(double value, int* calls = nullptr)
{
    return [=](KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
               bool canonical) {
        if (calls) ++*calls;
        EXPECT_TRUE(constant) << "each new stream starts out constant";
        return new Leaf(name, factory, constant, timeScale, canonical, 1, value);
    };
}

KFS_FactoryFunc GroupFunc(std::vector<KFS_MatchName> const& children)
{
    return [=](KFS_MatchName const& name, KFS_StreamFactory* factory, bool, unsigned int, bool canonical) {
        return new TestNamedGroup(name, factory, canonical, children);
    };
}

TEST_F(Factory, TheFirstRegistrationOfANameStands)
{
    int calls = 0;
    Q_MemoryCount const empty = Q_MemoryLive(nullptr);
    EXPECT_TRUE(factory.RegisterFactoryFunc(Name("blur"), LeafFunc(1.0), false));
    auto* const canonical = dynamic_cast<TestLeaf*>(factory.GetCanonicalStream(Name("blur")));
    EXPECT_TRUE(canonical->IsCanonical() && !canonical->GetParent());
    EXPECT_EQ(600u, canonical->GetTimeScale());
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    EXPECT_FALSE(factory.RegisterFactoryFunc(Name("blur"), LeafFunc(2.0, &calls), false));
    for (KFS_StreamBase* const late : {new TestLeaf(Name("blur"), &factory, true, 600, false, 1, 3.0), canonical})
        EXPECT_EQ(canonical, factory.RegisterCanonicalInstance(late)) << "another is deleted, the registered one isn't";
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
    EXPECT_EQ(canonical, factory.GetCanonicalStream(Name("blur")));
    EXPECT_EQ(canonical, factory.GetCanonicalInstance(Name("blur")));
    EXPECT_EQ(1.0, canonical->ValueAt(0));
    EXPECT_EQ(0, calls);
    EXPECT_TRUE(factory.UnregisterFactoryFunc_NullOK(Name("blur"), false));
    EXPECT_EQ(empty, Q_MemoryLive(nullptr));
    EXPECT_EQ(nullptr, factory.GetCanonicalStream(Name("blur")));
}

// Also one whose function gives nothing, which doesn't register.
TEST_F(Factory, AnUnknownKindIsNothing)
{
    Names log;
    auto const previous = Q_SetLogSink([&](int level, char const* tag, char const* topic, char const* text) {
        log.push_back(std::to_string(level) + " " + tag + " " + topic + ": " + text);
    });
    KFS_FactoryFunc const nothing = [](auto...) { return nullptr; };
    KFS_MatchName const name = Name("no such");
    EXPECT_EQ(nullptr, factory.GetCanonicalInstance(name));
    EXPECT_EQ(nullptr, factory.GetCanonicalStream(name));
    EXPECT_EQ(nullptr, factory.CreateStream(name, true, 600, false, false));
    EXPECT_EQ(KFS_Err_UnknownStream, KFSp_Boundary([&] { factory.CreateStream(name, true, 600, true, false); }));
    EXPECT_EQ(KFS_Err_UnknownStream, KFSp_Boundary([&] { factory.RegisterFactoryFunc(name, nothing, false); }));
    Reported const unknown{0x1D0000, 8, "asked to create unknown property of type #{ldquo}no such#{rdquo}",
                           KFS_Err_UnknownStream};
    EXPECT_EQ((std::vector<Reported>{unknown, unknown}), reports.Take());
    EXPECT_FALSE(factory.UnregisterFactoryFunc_NullOK(name, true));
    EXPECT_EQ(Names{}, log);
    EXPECT_FALSE(factory.UnregisterFactoryFunc(name));
    EXPECT_EQ(Names{"0 KFS UnregisterFactoryFunc: no such"}, log);
    EXPECT_TRUE(factory.RegisterFactoryFunc(name, LeafFunc(0.0), false)) << "the name is free";
    EXPECT_TRUE(factory.UnregisterFactoryFunc(name));
    Q_SetLogSink(previous);
}

// A node asks its own factory.
TEST_F(Factory, KindsOfAnotherOneStandThereAlone)
{
    KFS_StreamFactory other;
    TestKinds kindsThere(&other);
    kindsThere.Leaf("only there", 1, 3.0);
    const std::unique_ptr<KFS_StreamBase> stream(other.CreateStream(Name("only there"), true, 600, true, false));
    EXPECT_EQ(other.GetCanonicalStream(Name("only there")), stream->GetCanonicalStream(Name("only there")));
    kinds.Leaf("only here", 1, 3.0);
    EXPECT_EQ(nullptr, stream->GetCanonicalStream(Name("only here")));
    EXPECT_EQ(nullptr, stream->CreateStream(Name("only here"), true, 600, false, false));
    const std::unique_ptr<KFS_StreamBase> keyed(stream->CreateStream(Name("only there"), false, 30, true, false));
    EXPECT_EQ(1, keyed->GetAsLeaf()->GetKeyCount());
    EXPECT_EQ(30u, keyed->GetAsLeaf()->GetTimeScale());
}

TEST_F(Factory, AKindRegisteredAsAnObjectIsClonedFromIt)
{
    auto* const object = new TestLeaf(Name("glow"), &factory, true, 600, false, 1, 7.0);
    object->InsertDefaultKey(T_Time{0, 1});
    object->SetDisplayName(Q_MBToUTF16String("Glow"));
    object->SetSMDataPath(std::string("glow data"));
    EXPECT_EQ(object, factory.RegisterCanonicalInstance(object));
    EXPECT_TRUE(object->IsCanonical());
    {
        Q_ScAutoPtr<KFS_StreamBase> const made(factory.CreateStream(Name("glow"), true, 30, true, false));
        EXPECT_TRUE(!made->IsCanonical() && made->GetAsLeaf()->GetTimeScale() == 30u);
        EXPECT_EQ(7.0, static_cast<TestLeaf*>(made.get())->ValueAt(0));
        EXPECT_EQ(Q_MBToUTF16String("Glow"), made->GetDisplayName());
        object->SetSMDataPath(std::string("later data"));
        EXPECT_EQ("glow data", boost::any_cast<std::string>(made->GetSMDataPath()));
        Q_ScAutoPtr<KFS_StreamBase> const keyed(factory.MakeInstanceFromCanonical(Name("glow"), false, 30));
        EXPECT_TRUE(keyed->GetAsLeaf()->HasKeys());
    }
    EXPECT_TRUE(factory.UnregisterCanonicalInstance(object));
    EXPECT_EQ(nullptr, factory.GetCanonicalInstance(Name("glow")));
    EXPECT_EQ(nullptr, factory.CreateStream(Name("glow"), true, 600, false, false));
}

TEST_F(Factory, ABatchUnregistersBackwardsAndOnlyWhatItRegistered)
{
    static Names gone;
    gone.clear();
    class Witness : public TestLeaf {
    public:
        using TestLeaf::TestLeaf;
        ~Witness() override { gone.push_back(NameOf(this)); }
    };
    kinds.Leaf("taken", 1, 0.0);
    {
        KFS_ScRegisterStreams batch(&factory);
        for (char const* const name : {"one", "taken", "two"}) {
            batch.Register(Name(name), LeafFunc<Witness>(5.0), false);
            EXPECT_TRUE(batch.IsRegistered(Name(name)));
        }
        EXPECT_FALSE(batch.IsRegistered(Name("three")));
        EXPECT_TRUE(Q_ScAutoPtr<KFS_StreamBase>(batch.CreateStream(Name("two")))->GetAsLeaf()->HasKeys());
        EXPECT_EQ(Names{"two"}, std::exchange(gone, {}));
        batch.UnregisterAll();
        EXPECT_EQ((Names{"two", "one"}), gone);
        EXPECT_NE(nullptr, factory.GetCanonicalStream(Name("taken")));
        batch.UnregisterAll();
        EXPECT_EQ(2u, gone.size()) << "the batch is empty";
        batch.Register(Name("left"), LeafFunc<Witness>(5.0), false);
    }
    EXPECT_NE(nullptr, factory.GetCanonicalStream(Name("left"))) << "the end of the scope unregisters nothing";
    EXPECT_TRUE(factory.UnregisterFactoryFunc(Name("left")));
}

// outer { shared, inner { shared, deep }, own }: which kinds go with which group.
TEST_F(Factory, DataFileGroupsGoWithTheirChildrenAndTextStreamsAreASet)
{
    Names const all{"deep", "inner", "outer", "own", "shared"};
    struct {
        char const* why;
        Names containers, left;
    } const rows[] = {
        {"both, in either order", {"outer", "inner"}, {}},
        {"the inner one", {"inner"}, {"outer", "own"}},
        {"the outer one, whose subgroup goes as a kind", {"outer"}, {"deep"}},
        {"all the way down", {}, {}},
        {"an unknown one, which stays in the set", {"nobody"}, all},
        {"a leaf", {"own"}, all},
    };
    for (auto const& row : rows) {
        SCOPED_TRACE(row.why);
        TestKinds local;
        for (char const* const name : {"shared", "deep", "own"}) local.Leaf(name, 1, 0.0);
        local.Named("inner", {Name("shared"), Name("deep")});
        local.Named("outer", {Name("shared"), Name("inner"), Name("own")});
        for (std::string const& name : row.containers) factory.RegisterDataFileContainer(Name(name.c_str()));
        EXPECT_LE(row.containers.size(), factory.GetDataFileMatchNames().size());
        if (row.containers.empty())
            factory.UnregisterCanonicalMatchName(Name("outer"), {});
        else
            factory.UnRegisterDataFileContainers();
        Names left;
        for (std::string const& name : all)
            if (factory.GetCanonicalInstance(Name(name.c_str()))) left.push_back(name);
        EXPECT_EQ(row.left, left);
    }
    for (int i = 0; i < 2; ++i) factory.RegisterDataFileTextStream(Name("caption"));
    EXPECT_TRUE(factory.IsDataFileTextStream(Name("caption")) && !factory.IsDataFileTextStream(Name("title")));
    factory.UnRegisterDataFileTextStreams();
    EXPECT_FALSE(factory.IsDataFileTextStream(Name("caption")));
}

// Replaces an old "amount" by "red" and "blue": the old value goes to both.
class Tint : public TestNamedGroup {
public:
    using TestNamedGroup::TestNamedGroup;
    void UpgradeChildStream(KFS_StreamBase* obsolete) override
    {
        T_Time const zero{0, 600};
        double const value = static_cast<TestLeaf*>(obsolete)->ValueAt(0);
        for (char const* const name : {"blue", "red"})
            EXPECT_EQ(0, KFS_InsertKeyF(GetEditableLeafStream(Name(name)), &zero, 1, &value, 0, 0));
    }
};

TEST_F(Factory, AnObsoleteStreamIsReplacedByItsGroupsNewChildren)
{
    for (char const* const name : {"amount", "red", "green", "blue"}) kinds.Leaf(name, 1, 0.0);
    kinds.Named("part", {Name("green")});
    kinds.Group<Tint>("tint", {Name("red"), Name("part"), Name("green"), Name("blue")});
    factory.GetCanonicalStream(Name("part"))->GetAsNamedGroup()->EnsureUILayoutComplete();
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    {
        TestLeaf old(Name("amount"), &factory, true, 600, false, 1, 42.0),
            red(Name("red"), &factory, true, 600, false, 1, 0.0);
        old.InsertDefaultKey(T_Time{0, 1});
        std::vector<KFS_Stream*> result{&red};
        EXPECT_FALSE(old.GatherObsoleteReplacementStreams(result));
        EXPECT_EQ(std::vector<KFS_Stream*>{&red}, result);
        old.RegisterObsoleteStreamParent(Name("amount"), Name("tint"));
        factory.RegisterObsoleteStreamParent(Name("amount"), Name("part"));  // the first stands
        factory.RegisterObsoleteStreamParent(Name("red"), Name("blue"));
        EXPECT_TRUE(old.GatherObsoleteReplacementStreams(result));
        Names names;  // of those that the conversion made real, in display order
        for (KFS_Stream* const stream : result) {
            names.push_back(NameOf(stream));
            EXPECT_EQ(nullptr, stream->GetParent());
            EXPECT_EQ(42.0, static_cast<TestLeaf*>(stream)->ValueAt(0));
            delete stream;
        }
        EXPECT_EQ((Names{"red", "blue"}), names);
        EXPECT_TRUE(factory.GatherObsoleteReplacementStreams(&red, result));
        EXPECT_TRUE(result.empty()) << "a leaf replaces nothing";
    }
    EXPECT_EQ(before, Q_MemoryLive(nullptr));
}

int CountRealLeaves(KFS_StreamGroup& group)
{
    int real = 0;
    auto count = [&real](KFS_Stream*) { ++real; };
    group.ForEachNonCanonicalLeafStream(count, nullptr);
    return real;
}

TEST_F(Factory, DecanonicalizingMakesTheWholeTreeReal)
{
    SceneKinds const scene;
    KFS_DecanonicalizeAllChildStreamsDeep(nullptr);
    struct Owned : TestRoot<TestNamedGroup> {
        explicit Owned(KFS_Project* project) : TestRoot("node"), project_(project) {}
        KFS_Project* GetProject() const override { return project_; }
        KFS_Project* project_;
    } root(&session.GetProject());
    Q_RenderContext* const context = session.GetProject().GetRenderContext(false);
    auto* const state = dynamic_cast<KFS_RenderState*>(context->PeekState(KFS_RenderState::S_StateName));
    {
        auto const outer = state->SuspendAutoDecanonicalize();
        static_cast<void>(state->SuspendAutoDecanonicalize());
        KFS_DecanonicalizeAllChildStreamsDeep(&root);
        EXPECT_EQ(0, CountRealLeaves(root)) << "while the project suspends it";
    }
    KFS_DecanonicalizeAllChildStreamsDeep(&root);
    EXPECT_EQ(5, CountRealLeaves(root));
    EXPECT_EQ(&root, root.GetStream(0)->GetParent());
    EXPECT_FALSE(KFS_ShouldAlwaysDecanonicalize()) << "off unless somebody switched it on";
}

// The switch is read once in a process, so this needs one of its own. Answers 10 for each real leaf of a new node, and
// 1 if a slot that was made canonical is real again.
int CountWithTheSwitchOn()
{
    hearth::debug::DebugDatabase::Instance().SetEntry("VX.DecanonicalizeImmediatelyR", "1");
    SceneKinds const scene;
    auto const made = TestKinds::Make("node");
    auto* const node = made->GetAsNamedGroup();
    int const answer = 10 * CountRealLeaves(*node);
    Q_ScAutoPtr<KFS_StreamBase> const left(node->SwapCanonicalForStream(Name("opacity")));
    KFS_StreamBase const* const now = node->GetEditableStreamNullOK(Name("opacity"));
    return answer + (left && now && now != left.get() ? 1 : 0);
}

TEST_F(Factory, TheDevelopmentSwitchMakesEverythingRealAtOnce)
{
    testing::GTEST_FLAG(death_test_style) = "threadsafe";
    EXPECT_EXIT(std::_Exit(CountWithTheSwitchOn()), testing::ExitedWithCode(51), "");
}

TEST_F(Factory, NoFailedAllocationLeavesAHalfRegisteredKind)
{
    struct Nothing {};
    kinds.Leaf("part", 1, 0.0);
    for (KFS_FactoryFunc const& func : {LeafFunc(0.0), GroupFunc({Name("part")})}) {
        FailEveryAllocation([] { return std::make_unique<Nothing>(); },
                            AtBoundary([&](Nothing&) { factory.RegisterFactoryFunc(Name("kind"), func, false); }),
                            [&](Nothing&, int code, Q_MemoryCount const& before) {
                                reports.Take();
                                EXPECT_TRUE(code == 0 || before == Q_MemoryLive(nullptr));
                                EXPECT_EQ(code == 0, factory.GetCanonicalInstance(Name("kind")) != nullptr);
                                EXPECT_EQ(code == 0, factory.GetCanonicalStream(Name("kind")) != nullptr);
                                factory.UnregisterFactoryFunc_NullOK(Name("kind"), true);
                            });
        EXPECT_TRUE(factory.UnregisterFactoryFunc(Name("kind")));
    }
}

TEST_F(Factory, ALayoutOfUnknownKindsIsRefusedWithItsGroup)
{
    std::vector<KFS_MatchName> const children{Name("early"), Name("late")};
    kinds.Leaf("early", 1, 0.0);
    ExpectBroken(reports, "UI layout has an unregistered child",
                 [&] { return factory.RegisterFactoryFunc(Name("group"), GroupFunc(children), false); });
    EXPECT_EQ(nullptr, factory.GetCanonicalStream(Name("group")));
    kinds.Deferred<TestNamedGroup>("group", children);
    ExpectBroken(reports, "UI layout has an unregistered child", [&] { factory.SetupCanonicalStream(Name("group")); });
    kinds.Leaf("late", 1, 0.0);
    factory.SetupCanonicalStream(Name("group"));
    EXPECT_EQ("late", NameOf(factory.GetCanonicalStream(Name("group"))->GetAsGroup()->GetStream(1)));
}

}  // namespace
