#pragma once

#include "frame/frame.h"
#include "tests/support/streams.h"
#include "tree/factory.h"
#include "tree/indexedgroup.h"
#include "tree/namedgroup.h"

#include <map>
#include <string>
#include <vector>

// Concrete kinds of streams, as a host would define them, and their registration. Names are written as plain texts.

inline KFS_MatchName Name(char const* text)
{
    return KFS_MatchName(text, true);
}

inline std::string NameOf(KFS_StreamBase const* stream)
{
    unsigned char const* const text = stream->GetMatchName().GetName();
    return text ? reinterpret_cast<char const*>(text) : "";
}

// A leaf with a default value, the same in all its components.
class TestLeaf : public KFS_Stream {
public:
    TestLeaf(KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
             bool canonical, short dimension, double defaultValue)
        : KFS_Stream(dimension, timeScale, constant, false, KFS_InterpMask_All, 0, Desc(), &name, factory, canonical),
          defaultValue_(defaultValue)
    {
        pSetDisplayName(GetMatchName16Str());
    }
    TestLeaf(TestLeaf const& source, KFS_CloneStreamParams const& params)
        : KFS_Stream(source, params),
          defaultValue_(source.defaultValue_)
    {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override
    {
        return new TestLeaf(*this, params);
    }
    void InsertDefaultKey(T_Time const& time) override
    {
        ++defaultKeys;
        std::vector<double> const value(static_cast<std::size_t>(GetDimension()), defaultValue_);
        KFSp_ThrowIf(KFS_InsertKeyF(this, &time, 1, value.data(), 0, 0));
    }
    bool IsStaticValueModified() const override { return HasNoValue() || ValueAt(0) != defaultValue_; }
    bool NeedsResetAfterStored() const override { return needsReset; }
    // The first component at a time in the stream's scale.
    double ValueAt(int time) const
    {
        std::vector<double> value(static_cast<std::size_t>(GetDimension()), -12345.0);
        T_Time const at{time, GetTimeScale()};
        EXPECT_EQ(0, KFS_GetValueFPlus(this, &at, 0, value.data(), nullptr, nullptr));
        return value[0];
    }

    int defaultKeys = 0;  // how often the default was asked for
    static inline bool needsReset = false;

private:
    static KFS_ValueDesc Desc()
    {
        KFS_ValueDesc desc;
        desc.dataType = KFS_Type_Double;
        return desc;
    }

    double defaultValue_;
};

// A named or an indexed group whose layout is a list of names.
template <class Base>
class TestGroup : public Base {
public:
    TestGroup(KFS_MatchName const& name, KFS_StreamFactory* factory, bool canonical, std::vector<KFS_MatchName> kinds)
        : Base(&name, factory, canonical),
          kinds_(std::move(kinds))
    {
        this->pSetDisplayName(this->GetMatchName16Str());
    }
    TestGroup(TestGroup const& source, KFS_CloneStreamParams const& params)
        : Base(source, params),
          kinds_(source.kinds_)
    {}
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override
    {
        return new TestGroup(*this, params);
    }
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override
    {
        for (KFS_MatchName const& kind : kinds_) layout->push_back(this->GetFactory()->GetCanonicalStream(kind));
    }

private:
    std::vector<KFS_MatchName> kinds_;
};
using TestNamedGroup = TestGroup<KFS_NamedStreamGroup>;
using TestIndexedGroup = TestGroup<KFS_IndexedStreamGroup>;

// A root without a kind of its own, which is heard, and takes its kind's layout and scale from the arguments.
template <class Base>
class TestRoot : public Base {
public:
    TestRoot(char const* name, unsigned int timeScale = 600)
        : Base(Name(name), Get_VX_StreamFactory(), false, {}),
          timeScale_(timeScale)
    {}
    int ProbeListenerState() override { return KFS_ListenerState_Heard; }
    unsigned int GetPreferredTimeScale() const override { return timeScale_; }

private:
    unsigned int timeScale_;
};

// Registers kinds with the default factory for a scope; streams of them must be gone before.
class TestKinds {
public:
    explicit TestKinds(KFS_StreamFactory* factory = Get_VX_StreamFactory()) : batch_(factory) {}
    ~TestKinds() { batch_.UnregisterAll(); }
    TestKinds(TestKinds const&) = delete;
    TestKinds& operator=(TestKinds const&) = delete;

    void Leaf(char const* name, short dimension, double defaultValue)
    {
        batch_.Register(
            Name(name),
            [=](KFS_MatchName const& kind, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
                bool canonical) {
                return new TestLeaf(kind, factory, constant, timeScale, canonical, dimension, defaultValue);
            },
            false);
    }
    void Named(char const* name, std::vector<KFS_MatchName> const& kinds) { Group<TestNamedGroup>(name, kinds); }
    void Indexed(char const* name, std::vector<KFS_MatchName> const& kinds) { Group<TestIndexedGroup>(name, kinds); }

    // A group of a class of the test's own. The layout is deferred, so that it may hold its own kind.
    template <class G>
    void Group(char const* name, std::vector<KFS_MatchName> const& kinds)
    {
        Deferred<G>(name, kinds);
        Get_VX_StreamFactory()->SetupCanonicalStream(Name(name));
    }
    // The caller sets the layout up once all its kinds are registered.
    template <class G>
    void Deferred(char const* name, std::vector<KFS_MatchName> const& kinds)
    {
        batch_.Register(
            Name(name),
            [=](KFS_MatchName const& kind, KFS_StreamFactory* factory, bool, unsigned int, bool canonical) {
                return new G(kind, factory, canonical, kinds);
            },
            true);
    }

    // A new real stream of a kind, a leaf being constant.
    static Q_ScAutoPtr<KFS_StreamBase> Make(char const* name)
    {
        return Q_ScAutoPtr<KFS_StreamBase>(Get_VX_StreamFactory()->CreateStream(Name(name), true, 600, true, false));
    }

private:
    KFS_ScRegisterStreams batch_;
};

// A small scene:
//
//   layers (indexed)          nodes, groups of layers and single opacities
//   node                      opacity, transform, position, rotation
//   transform                 scale, anchor
//
// The layouts aren't in the order of the match names' hashes, which is how the children are sorted.
class SceneKinds : public TestKinds {
public:
    SceneKinds()
    {
        Leaf("opacity", 1, 100.0);
        Leaf("position", 3, 0.0);
        Leaf("rotation", 1, 0.0);
        Leaf("scale", 2, 1.0);
        Leaf("anchor", 2, 0.0);
        Named("transform", {Name("scale"), Name("anchor")});
        Named("node", {Name("opacity"), Name("transform"), Name("position"), Name("rotation")});
        Indexed("layers", {Name("node"), Name("layers"), Name("opacity")});
    }
};

// A running library with the kinds of the scene.
class SceneTest : public StreamTest {
protected:
    SceneKinds kinds;

    static std::unique_ptr<KFS_NamedStreamGroup> MakeNode()
    {
        return std::unique_ptr<KFS_NamedStreamGroup>(TestKinds::Make("node").release()->GetAsNamedGroup());
    }
    static KFS_NamedStreamGroup* AddNode(KFS_IndexedStreamGroup& layers)
    {
        Q_ScAutoPtr<KFS_StreamBase> node = TestKinds::Make("node");
        return layers.GetEditableStream(layers.AppendStream(&node))->GetAsNamedGroup();
    }
    static KFS_StreamBase const* Canonical(char const* name)
    {
        return Get_VX_StreamFactory()->GetCanonicalStream(Name(name));
    }
};

// Expects that `action` finds a broken invariant: the text is reported and the int 3 thrown.
template <class Action>
void ExpectBroken(ReportRecorder& reports, std::string const& text, Action&& action)
{
    EXPECT_EQ(3, KFSp_Boundary([&] { static_cast<void>(action()); })) << text;
    std::vector<Reported> const seen = reports.Take();
    ASSERT_EQ(1u, seen.size()) << text;
    EXPECT_EQ(text, seen[0].text);
}
