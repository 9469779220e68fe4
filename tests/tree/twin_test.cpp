#include "tests/tree/twin.h"

#include "tests/support/chunklines.h"
#include "tests/support/notifications.h"

#include <rapidcheck.h>

#include <cstdlib>

// Random scripts on a tree of streams and on its twin: whatever anybody can see of the two is compared.

std::ostream& operator<<(std::ostream& out, Edit const& e)
{
    return out << "{\"" << e.op << "\", " << e.group << ", " << e.at << ", " << e.to << "}";
}
std::ostream& operator<<(std::ostream& out, Step const& s)
{
    return out << "{" << s.edit << ", \"" << s.moment << "\", " << s.nested << "},";
}

namespace rc {
template <>
struct Arbitrary<Edit> {
    static Gen<Edit> arbitrary()
    {
        auto const number = gen::inRange(0U, 60U);
        return gen::build<Edit>(gen::set(&Edit::op, gen::elementOf(Ops)), gen::set(&Edit::group, number),
                                gen::set(&Edit::at, number), gen::set(&Edit::to, number));
    }
};
template <>
struct Arbitrary<Step> {
    static Gen<Step> arbitrary()
    {
        auto const moment =
            gen::weightedOneOf<std::string>({{2, gen::just(std::string())}, {1, gen::elementOf(Moments)}});
        return gen::build<Step>(gen::set(&Step::edit), gen::set(&Step::moment, moment), gen::set(&Step::nested));
    }
};
}  // namespace rc

namespace {

using Lines = std::vector<std::string>;
using Made = Q_ScAutoPtr<KFS_StreamBase>;

std::string Text(KFS_StreamIDPath const& path)
{
    std::string text;
    for (KFS_StreamID const& id : path.GetPathConst()) {
        text += "/" + (id.GetIndex() == KFS_StreamID::NoIndex ? "" : std::to_string(id.GetIndex()));
        text += reinterpret_cast<char const*>(id.GetMatchName().GetName());
    }
    return text;
}

// The same scripts on streams.
class RealTree : public Scripted<RealTree, KFS_StreamBase> {
public:
    explicit RealTree(ReportRecorder& reports) : reports_(reports)
    {
        listener_.look = [this](KFS_StreamGroup*, KFS_StreamBase const*) {
            return Heard(listener_.Current()), std::string();
        };
        listener_.called = [this](KFS_StreamBase const* stream) { return Label(stream); };
    }

    TestRoot<TestIndexedGroup> root{"list", TwinTree::RootScale};

private:
    using Node = KFS_StreamBase;
    friend Scripted<RealTree, Node>;

    Node* Root() { return &root; }
    static std::string Kind(Node const* node) { return NameOf(node); }
    static Node const* Parent(Node const* node) { return node->GetParent(); }
    static std::size_t Length(Node const* list) { return list->GetAsGroup()->GetNumStreams(); }
    std::optional<Node*> Child(Node* group, std::size_t i)
    {
        if (!group->IsNamedGroup()) return group->GetAsGroup()->GetEditableStreamNullOK(Int(i));
        KFS_NamedStreamGroup* const named = group->GetAsNamedGroup();
        KFS_MatchName const name = NameIn(group, i);
        return named->GetStream(name, false) ? std::optional(named->GetEditableStreamNullOK(name)) : std::nullopt;
    }
    std::string Label(Node const* stream)
    {
        if (stream->IsCanonical()) return NameOf(stream) + "~";
        if (!stream->GetRefCon()) stream->SetRefCon(reinterpret_cast<KFS_ClientRefCon*>(++lastId_));
        return NameOf(stream) + "#" + std::to_string(reinterpret_cast<std::uintptr_t>(stream->GetRefCon()));
    }
    std::string Facts(Node* node)
    {
        KFS_StreamGroup const* const top = node->GetRoot();
        unsigned int depth = 0;
        RC_ASSERT(node->IsChildOf(top, &depth) == (top != nullptr));
        KFS_StreamGroup* pathRoot = nullptr;
        KFS_StreamIDPath path;
        node->SlowGetPathFromRootToMe(&pathRoot, &path);
        std::string text = "{" + std::to_string(node->GetStreamBaseFlags()) + " " +
                           Q_UTF16ToMBString(node->GetDisplayName()) + (node->AreAllParentsActive() ? "" : " off") +
                           (node->IsHiddenByAncestor() ? " hidden" : "") + (node->IsModified() ? " modified" : "") +
                           (node->IsAnimated(false) ? " animated" : "") + " " + std::to_string(depth) + " " +
                           Text(path);
        if (auto const* const leaf = dynamic_cast<TestLeaf const*>(node))
            text += " " + std::to_string(leaf->ValueAt(0)) + " at " + std::to_string(leaf->GetTimeScale());
        for (unsigned int i = 0; i < Count(node); ++i) Check(node->GetAsGroup(), i);
        if (pathRoot == &root) CheckPath(node, path);
        if (node == &root) CheckWalk();
        return text + "}";
    }
    // What a group says of a child in many ways, one way against the other.
    void Check(KFS_StreamGroup* group, unsigned int index)
    {
        Node const* const child = group->GetStream(index);
        Node const* const real = child->IsCanonical() ? nullptr : child;
        KFS_MatchName const& name = child->GetMatchName();
        RC_ASSERT(group->GetStream(KFS_StreamID(index, name)) == child);
        RC_ASSERT(group->GetEditableStreamNullOK(index) == real);
        RC_ASSERT(std::as_const(*group).GetEditableStreamNullOK(index) == real);
        RC_ASSERT(group->CanStore(name));
        if (KFS_NamedStreamGroup const* const named = group->GetAsNamedGroup()) {
            RC_ASSERT(named->GetNumStreams() == Layout(group).size());
            RC_ASSERT(named->GetStream(name, true) == child);
            RC_ASSERT(named->GetStream(KFS_StreamID(name)) == child);
            RC_ASSERT(named->GetIndexInUILayout(name) == index);
            RC_ASSERT(named->GetEditableStreamNullOK(name) == real);
            RC_ASSERT(named->GetLeafStream(name) == child->GetAsLeaf());
            if (real) RC_ASSERT(named->IsModifiedByName(name) == child->IsModified());
        } else {
            RC_ASSERT(group->GetAsIndexedGroup()->GetLeafStream(index) == child->GetAsLeaf());
        }
    }
    void CheckPath(Node* node, KFS_StreamIDPath const& path)
    {
        RC_ASSERT(root.FindStream(path) == node);
        RC_ASSERT(root.FindEditableStream(path) == node);
        KFS_StreamIDPath read;
        read.SetFrom_JSON(path.GetAs_JSON());
        RC_ASSERT(root.FindEditableLeafStreamNullOK(read) == node->GetAsLeaf());
    }
    // The walk over the real leaves gives each its path, behind what was there.
    void CheckWalk()
    {
        std::vector<Node*> walked;
        KFS_StreamIDPath path(7);
        auto note = [&](KFS_Stream* leaf) {
            KFS_StreamIDPath below = path;
            below.RemoveHead();
            RC_ASSERT(root.FindStream(below) == leaf);
            walked.push_back(leaf);
        };
        root.ForEachNonCanonicalLeafStream(note, &path);
        RC_ASSERT(walked == Of("l", &root));
        RC_ASSERT(path.GetLength() == 1U);
        auto forget = [&](KFS_Stream*) { walked.pop_back(); };
        root.ForEachNonCanonicalLeafStream(forget, nullptr);
        RC_ASSERT(walked.empty());
    }

    template <class F>
    int Try(F const& f)
    {
        int const code = KFSp_Boundary([&] { f(); });
        for (Reported const& report : reports_.Take()) log.push_back("report " + report.text);
        return code;
    }

    static unsigned int Int(std::size_t number) { return static_cast<unsigned int>(number); }
    static KFS_IndexedStreamGroup* List(Node* node) { return node->GetAsIndexedGroup(); }
    static KFS_NamedStreamGroup* Named(Node* node) { return node->GetAsNamedGroup(); }
    KFS_MatchName NameIn(Node const* group, std::size_t slot) { return Name(Layout(group)[slot].c_str()); }

    static Made Make(std::string const& kind, bool keyed)
    {
        return Made(Get_VX_StreamFactory()->CreateStream(Name(kind.c_str()), !keyed, 600, true, false));
    }
    static void Delete(Node* node) { delete node; }
    static void Insert(Node* list, std::size_t at, Made& made) { List(list)->InsertStream(Int(at), &made); }
    static void Append(Node* list, Made& made)
    {
        Node const* const stream = made.get();
        unsigned int const place = List(list)->AppendStream(&made);
        RC_ASSERT((place == Length(list) || List(list)->GetStream(place) == stream));
    }
    static Node* Swap(Node* list, std::size_t at, Made& made) { return List(list)->SwapStream(Int(at), &made); }
    static Node* Remove(Node* list, std::size_t at) { return List(list)->RemoveStream(Int(at)); }
    static bool RemoveChild(Node* from, Node* child) { return from->GetAsGroup()->RemoveChild(child); }
    static void Move(Node* list, std::size_t from, std::size_t to) { List(list)->ReorderStreams(Int(from), Int(to)); }
    static void Duplicate(Node* list, std::size_t at)
    {
        Node const* const copy = List(list)->DuplicateStream(Int(at));
        RC_ASSERT((!copy || copy->GetParent() == list));
    }
    void Upgrade(Node* group, std::size_t slot, unsigned int form)
    {
        unsigned int const index = Int(slot);
        KFS_MatchName const name = NameIn(group, slot);
        KFS_StreamID const ids[] = {{index}, {name}, {index, name}, {index, Name("other")}};
        Node const* const real = form < 3    ? Named(group)->GetEditableStream(ids[form])
                                 : form == 7 ? Named(group)->GetEditableStream(ids[3])
                                 : form < 5  ? Named(group)->GetEditableStream(index)
                                             : Named(group)->GetEditableStream(name);
        RC_ASSERT(real == Named(group)->GetStream(index));
    }
    static Node* SwapNamed(Node* group, Made& made) { return Named(group)->SwapStream(&made); }
    Node* SwapCanonical(Node* group, std::size_t slot)
    {
        return Named(group)->SwapCanonicalForStream(NameIn(group, slot));
    }
    static void Reset(Node* group) { Named(group)->ResetAllStreamsToCanonical(false); }
    static void CopyFrom(Node* group, Node* other) { Named(group)->CopyAcceptableStreams(*Named(other)); }
    static void SetFlags(Node* node, unsigned int value, unsigned int mask) { node->SetStreamBaseFlags(value, mask); }
    static void SetName(Node* node, std::string const& name) { node->SetDisplayName(Q_MBToUTF16String(name)); }
    static void SetIndependent(Node* node, bool on) { node->MakeIndependent(on); }
    static void SetValue(Node* leaf, double value)
    {
        T_Time const zero{0, leaf->GetAsLeaf()->GetTimeScale()};
        RC_ASSERT(KFS_InsertKeyF(leaf->GetAsLeaf(), &zero, 1, &value, 0, 0) == 0);
    }

    ReportRecorder& reports_;
    NotificationRecorder listener_;
    std::uintptr_t lastId_ = 0;
};

void Same(std::string const& expected, std::string const& seen)
{
    if (expected != seen) RC_FAIL("twin  " + expected + "\nreal  " + seen);
}
void Same(Lines const& expected, Lines const& seen)
{
    for (std::size_t i = 0; i < std::max(expected.size(), seen.size()); ++i)
        Same(i < expected.size() ? expected[i] : "nothing", i < seen.size() ? seen[i] : "nothing");
}

// Saved and loaded into a new tree.
void CompareFiles(TwinTree& twin, RealTree& real, ReportRecorder& reports)
{
    bool wasPaused = false;
    EXPECT_EQ(0, KFS_PauseMainListener(true, wasPaused));
    TwinTree loaded;
    loaded.Load(twin.root, loaded.root);
    RealTree other(reports);
    MemoryFile([&](CKF_File* out) { real.root.Write(out); }).Read([&](CKF_File* in) { other.root.Read(in, nullptr); });
    Same(loaded.Show(loaded.root, nullptr, true), other.Show(&other.root, nullptr, true));
    EXPECT_EQ(0, KFS_PauseMainListener(wasPaused, wasPaused));
}

void Compare(std::vector<Step> const& script, ReportRecorder& reports)
{
    Q_MemoryCount const before = Q_MemoryLive(nullptr);
    {
        TwinTree twin;
        RealTree real(reports);
        Same(twin.Show(twin.root, nullptr, true), real.Show(&real.root, nullptr, true));
        for (Step const& step : script) {
            twin.Do(step);
            real.Do(step);
            Same(std::exchange(twin.log, {}), std::exchange(real.log, {}));
            Same(twin.Show(twin.root, nullptr, true), real.Show(&real.root, nullptr, true));
        }
        CompareFiles(twin, real, reports);
        Made const clone(real.root.CloneStream(KFS_CloneStreamParams{true, true}));
        Twin* const twinClone = twin.Clone(twin.root);
        Same(twin.Show(twinClone, nullptr, true), real.Show(clone.get(), nullptr, true));
        twin.Free(twinClone);
    }
    RC_ASSERT(before == Q_MemoryLive(nullptr));
}

class TwinTest : public StreamTest {
protected:
    TwinTest()
    {
        Name("other");
        setenv("RC_PARAMS", "seed=20240607 max_success=120 max_size=60", 0);
        for (TwinKind const& kind : TwinKinds) {
            std::vector<KFS_MatchName> layout;
            for (std::string const& name : kind.layout) layout.push_back(Name(name.c_str()));
            if (kind.shape == 'l') kinds_.Leaf(kind.name, 1, kind.value);
            // The layout is set up once all kinds are there.
            if (kind.shape == 'n') kinds_.Deferred<TestNamedGroup>(kind.name, layout);
            if (kind.shape == 'i') kinds_.Deferred<TestIndexedGroup>(kind.name, layout);
        }
        for (TwinKind const& kind : TwinKinds)
            if (kind.shape != 'l') Get_VX_StreamFactory()->SetupCanonicalStream(Name(kind.name));
        for (TwinKind const& kind : TwinKinds)
            if (KFS_StreamBase* const node = Get_VX_StreamFactory()->GetCanonicalStream(Name(kind.name));
                kind.shape == 'n')
                node->GetAsNamedGroup()->EnsureUILayoutComplete();
        Run({{{"Append", 0, 0, 4}, "", {}}, {{"Append", 0, 0, 5}, "", {}}});  // fills in what is filled in once
    }
    // Outside of random checks.
    void Run(std::vector<Step> const& script)
    {
        try {
            Compare(script, reports);
        } catch (rc::detail::CaseResult const& result) {
            ADD_FAILURE() << result.description;
        }
    }
    TestKinds kinds_;
};

TEST_F(TwinTest, RandomScriptsGiveTheSameTreesNotificationsAndFiles)
{
    EXPECT_TRUE(rc::check(
        "a tree is as its twin", [this](std::vector<Step> const& script) { Compare(script, reports); }));
}

// A listener that edits the place of the edit that it is told of, in scripts as a failure prints them.
TEST_F(TwinTest, EditsInsideOfEdits)
{
    Step const leaf{{"Append", 0, 0, 0}, "", {}}, node{{"Append", 0, 0, 4}, "", {}};
    std::vector<Step> const scripts[] = {
        // the list becomes shorter, or loses the stream, before it is changed
        {leaf, {{"Insert", 0, 1, 0}, "before-insert", {"Remove", 0, 0, 0}}},
        {leaf, leaf, {{"Insert", 0, 0, 0}, "before-insert", {"Remove", 0, 0, 0}}},
        {leaf, {{"Remove", 0, 0, 0}, "before-remove", {"Remove", 0, 0, 0}}},
        {leaf, {{"Swap", 0, 0, 0}, "before-swap", {"Remove", 0, 0, 0}}},
        // the slot is made real, or canonical again, by somebody else
        {node, {{"Upgrade", 0, 0, 0}, "before-swap", {"Upgrade", 0, 0, 0}}},
        {node, {{"Upgrade", 0, 0, 0}, "after-swap", {"Canonical", 0, 0, 0}}},
        {node, {{"RemoveChild", 0, 1, 1}, "after-remove", {"SwapNamed", 0, 1, 0}}},
    };
    for (std::vector<Step> const& script : scripts) Run(script);
}

}  // namespace
