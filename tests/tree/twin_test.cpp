#include "tests/tree/twin.h"

#include "tests/support/chunklines.h"
#include "tests/support/notifications.h"

#include <rapidcheck.h>

#include <cstdlib>

// Random scripts on a tree of streams and on its twin: whatever anybody can see of the two is compared.

std::ostream& operator<<(std::ostream& out, Edit const& e)
{
    if (e.op == Op::End) return out << "{}";
    return out << "{Op::" << OpNames[static_cast<int>(e.op)] << ", " << e.group << ", " << e.at << ", " << e.to << "}";
}
std::ostream& operator<<(std::ostream& out, Step const& s)
{
    return out << "{" << s.edit << ", " << s.moment << ", " << s.nested << "},  // " << Moments[s.moment];
}

namespace rc {
template <>
struct Arbitrary<Edit> {
    static Gen<Edit> arbitrary()
    {
        auto const number = gen::inRange(0U, 60U);
        return gen::build<Edit>(gen::set(&Edit::op, gen::map(gen::inRange(0, static_cast<int>(Op::End)),
                                                             [](int op) { return static_cast<Op>(op); })),
                                gen::set(&Edit::group, number), gen::set(&Edit::at, number),
                                gen::set(&Edit::to, number));
    }
};
template <>
struct Arbitrary<Step> {
    static Gen<Step> arbitrary()
    {
        return gen::build<Step>(
            gen::set(&Step::edit),
            gen::set(&Step::moment, gen::weightedOneOf<unsigned int>({{2, gen::just(0U)}, {1, gen::inRange(0U, 9U)}})),
            gen::set(&Step::nested));
    }
};
}  // namespace rc

namespace {

using Lines = std::vector<std::string>;
using Made = Q_ScAutoPtr<KFS_StreamBase>;

// The same scripts on streams.
class RealTree {
public:
    explicit RealTree(ReportRecorder& reports) : reports_(reports)
    {
        listener_.look = [this](KFS_StreamGroup*, KFS_StreamBase const*) {
            return Heard(listener_.Current()), std::string();
        };
        listener_.called = [this](KFS_StreamBase const* stream) { return Label(stream); };
    }

    std::string Label(KFS_StreamBase const* stream)
    {
        if (stream->IsCanonical()) return NameOf(stream) + "~";
        if (!stream->GetRefCon()) stream->SetRefCon(reinterpret_cast<KFS_ClientRefCon*>(++lastId_));
        return NameOf(stream) + "#" + std::to_string(reinterpret_cast<std::uintptr_t>(stream->GetRefCon()));
    }

    std::string Show(KFS_StreamBase const* node, KFS_StreamGroup const* parent, bool whole,
                     KFS_StreamIDPath const& path = {})
    {
        std::string text = Label(node) + (node->GetParent() == parent ? "" : "*");
        if (whole) text += Facts(node) + " @" + Text(path);
        KFS_StreamGroup const* const group = node->GetAsGroup();
        if (!group) return text;
        text += "[";
        auto const layout = group->GetCanonicalLayout(group->GetMatchName());
        auto const count = group->IsNamedGroup() ? static_cast<unsigned int>(layout->size()) : group->GetNumStreams();
        for (unsigned int i = 0; i < count; ++i) {
            KFS_NamedStreamGroup const* const named = group->GetAsNamedGroup();
            KFS_StreamBase const* const child =
                named ? named->GetStream((*layout)[i]->GetMatchName(), false) : group->GetStream(i);
            if (!child) {
                text += "- ";
                continue;
            }
            if (whole) Check(group, child, i);
            KFS_StreamID const id =
                named ? KFS_StreamID(child->GetMatchName()) : KFS_StreamID(i, child->GetMatchName());
            text += child->IsCanonical() ? Label(child) : Show(child, group, whole, KFS_StreamIDPath(path, id));
            text += ' ';
        }
        return text + "]";
    }

    void Do(Step const& step)
    {
        moment = Moments[step.moment];
        nested_ = step.nested;
        int const code = Try([&] { Do(step.edit, false); });
        if (code != 0) log.push_back("code " + std::to_string(code));
        moment = Moments[0];
        for (KFS_StreamBase* const gone : std::exchange(limbo_, {})) delete gone;
    }

    Lines log;
    TestRoot<TestIndexedGroup> root{"list", TwinTree::RootScale};
    std::string moment = Moments[0];

private:
    static std::string Text(KFS_StreamIDPath const& path)
    {
        std::string text;
        for (KFS_StreamID const& id : path.GetPathConst()) {
            text += "/" + (id.GetIndex() == KFS_StreamID::NoIndex ? "" : std::to_string(id.GetIndex()));
            text += reinterpret_cast<char const*>(id.GetMatchName().GetName());
        }
        return text;
    }

    // What a group says of a child in many ways, one way against the other.
    void Check(KFS_StreamGroup const* group, KFS_StreamBase const* child, unsigned int index)
    {
        auto* const editable = const_cast<KFS_StreamGroup*>(group);
        KFS_StreamBase const* const real = child->IsCanonical() ? nullptr : child;
        KFS_MatchName const& name = child->GetMatchName();
        RC_ASSERT(group->GetStream(index) == child);
        RC_ASSERT(group->GetStream(KFS_StreamID(index, name)) == child);
        RC_ASSERT(editable->GetEditableStreamNullOK(index) == real);
        RC_ASSERT(std::as_const(*group).GetEditableStreamNullOK(index) == real);
        RC_ASSERT(group->CanStore(name));
        if (KFS_NamedStreamGroup const* const named = group->GetAsNamedGroup()) {
            RC_ASSERT(named->GetIndexInUILayout(name) == index);
            RC_ASSERT(named->GetEditableStreamNullOK(name) == real);
            RC_ASSERT(named->GetLeafStream(name) == child->GetAsLeaf());
            if (real) RC_ASSERT(named->IsModifiedByName(name) == child->IsModified());
        } else {
            RC_ASSERT(group->GetAsIndexedGroup()->GetLeafStream(index) == child->GetAsLeaf());
        }
        KFS_StreamGroup const* top = nullptr;
        KFS_StreamIDPath path;
        child->SlowGetPathFromRootToMe(&top, &path);
        if (top != &root || !real) return;
        RC_ASSERT(top == child->GetRoot());
        RC_ASSERT(root.FindStream(path) == child);
        RC_ASSERT(root.FindEditableStream(path) == child);
        KFS_StreamIDPath read;
        read.SetFrom_JSON(path.GetAs_JSON());
        RC_ASSERT(root.FindEditableLeafStreamNullOK(read) == child->GetAsLeaf());
    }
    std::string Facts(KFS_StreamBase const* node) const
    {
        KFS_StreamGroup const* const top = node->GetRoot();
        unsigned int depth = 0;
        RC_ASSERT(node->IsChildOf(top, &depth) == (top != nullptr));
        std::string text = "{" + std::to_string(node->GetStreamBaseFlags()) + " " +
                           Q_UTF16ToMBString(node->GetDisplayName()) + (node->AreAllParentsActive() ? "" : " off") +
                           (node->IsHiddenByAncestor() ? " hidden" : "") + (node->IsModified() ? " modified" : "") +
                           (node->IsAnimated(false) ? " animated" : "") + " " + std::to_string(depth);
        if (auto const* const leaf = dynamic_cast<TestLeaf const*>(node))
            text += " " + std::to_string(leaf->ValueAt(0)) + " at " + std::to_string(leaf->GetTimeScale());
        return text + "}";
    }

    void Heard(std::string const& line)
    {
        log.push_back(line);
        std::string const what = line.substr(0, line.find(' '));
        if (what == "destroyed" || what == "flags" || what == "name" || what == "value") return;
        log.back() += " in " + Show(&root, nullptr, false);
        if (what != moment) return;
        moment = Moments[0];
        if (nested_.op == Op::Throw) throw int{77};
        int const code = Try([&] { Do(nested_, true); });
        if (code != 0) log.push_back("nested code " + std::to_string(code));
    }
    template <class F>
    int Try(F const& f)
    {
        int const code = KFSp_Boundary([&] { f(); });
        for (Reported const& report : reports_.Take()) log.push_back("report " + report.text);
        return code;
    }

    std::vector<KFS_StreamBase*> Of(KFS_StreamBase* node, std::string const& shapes) const
    {
        std::vector<KFS_StreamBase*> found;
        if (shapes.find(node->IsNamedGroup() ? 'n' : node->IsLeaf() ? 'l' : 'i') != std::string::npos)
            found.push_back(node);
        KFS_StreamGroup* const group = node->GetAsGroup();
        for (unsigned int i = 0; group && i < group->GetNumStreams(); ++i)
            if (KFS_StreamBase* const child = group->GetEditableStreamNullOK(i))
                for (KFS_StreamBase* const each : Of(child, shapes)) found.push_back(each);
        return found;
    }
    void Own(KFS_StreamBase* stream)
    {
        if (stream) limbo_.push_back(stream);
    }
    void Do(Edit const& e, bool isNested);

    ReportRecorder& reports_;
    NotificationRecorder listener_;
    std::vector<KFS_StreamBase*> limbo_;
    Edit nested_;
    std::uintptr_t lastId_ = 0;
};

void RealTree::Do(Edit const& e, bool isNested)
{
    auto const lists = Of(&root, "i"), named = Of(&root, "n"), nodes = Of(&root, "lni"), leaves = Of(&root, "l");
    KFS_IndexedStreamGroup* const list = lists[e.group % lists.size()]->GetAsIndexedGroup();
    KFS_StreamBase* const node = nodes[e.group % nodes.size()];
    KFS_NamedStreamGroup* const group = named.empty() ? nullptr : named[e.group % named.size()]->GetAsNamedGroup();
    unsigned int const count = list->GetNumStreams(), at = e.at % (count + 2);
    unsigned int const slot = group ? e.at % group->GetNumStreams() : 0;
    KFS_MatchName const slotName = group ? group->GetStream(slot)->GetMatchName() : KFS_MatchName();
    auto const make = [](KFS_MatchName const& kind, bool keyed) {
        return Made(Get_VX_StreamFactory()->CreateStream(kind, !keyed, 600, true, false));
    };
    switch (e.op) {
    case Op::Insert:
    case Op::Append:
    case Op::Swap: {
        Made made = make(Name(TwinKinds[e.to % TwinKinds.size()].name), e.to % 5 == 1);
        KFS_StreamBase const* const stream = made.get();
        if (e.to % 7 == 2) made->MakeIndependent(true);
        if (e.op == Op::Swap) {
            Own(list->SwapStream(at, &made));
        } else if (e.op == Op::Insert) {
            list->InsertStream(at, &made);
        } else {
            unsigned int const place = list->AppendStream(&made);
            RC_ASSERT((place == list->GetNumStreams() || list->GetStream(place) == stream));
        }
        break;
    }
    case Op::Remove: Own(list->RemoveStream(at)); break;
    case Op::RemoveChild: {
        bool const isNamed = group && !isNested && e.to % 2 == 1;
        KFS_StreamGroup* const from = isNamed ? static_cast<KFS_StreamGroup*>(group) : list;
        if (from->GetNumStreams() == 0) break;
        KFS_StreamBase* const child = from->GetEditableStreamNullOK(e.at % from->GetNumStreams());
        if (!child || !from->RemoveChild(child)) break;
        Own(child);
        if (!isNamed) break;
        moment = Moments[0];
        group->ResetAllStreamsToCanonical(false);
        break;
    }
    case Op::Move: {
        unsigned int const from = e.at % (count + 1);
        list->ReorderStreams(from, isNested && count > 0 ? e.to % count : e.to % (count + 1));
        break;
    }
    case Op::Duplicate: {
        KFS_StreamBase* const copy = list->DuplicateStream(at);
        RC_ASSERT((!copy || copy->GetParent() == list));
        break;
    }
    case Op::Upgrade: {
        if (!group) break;
        KFS_StreamID const ids[] = {{slot}, {slotName}, {slot, slotName}};
        if (e.to % 8 == 7) group->GetEditableStream(KFS_StreamID(slot, Name("other")));
        KFS_StreamBase* const real = e.to % 8 < 3   ? group->GetEditableStream(ids[e.to % 8])
                                     : e.to % 8 < 5 ? group->GetEditableStream(slot)
                                                    : group->GetEditableStream(slotName);
        RC_ASSERT(real == group->GetStream(slot));
        break;
    }
    case Op::SwapNamed: {
        if (!group) break;
        Made made = make(e.to % 5 == 4 ? Name("list") : slotName, e.to % 2 == 1);
        if (e.to % 3 == 2) made->MakeIndependent(true);
        Own(group->SwapStream(&made));
        break;
    }
    case Op::Canonical:
        if (group) Own(group->SwapCanonicalForStream(slotName));
        break;
    case Op::Reset:
    case Op::Copy: {
        if (!group || isNested) break;
        moment = Moments[0];
        KFS_NamedStreamGroup* const other = named[e.at % named.size()]->GetAsNamedGroup();
        if (e.op == Op::Reset)
            group->ResetAllStreamsToCanonical(false);
        else if (group != other && !other->IsChildOf(group, nullptr))
            group->CopyAcceptableStreams(*other);
        break;
    }
    case Op::Flags: {
        unsigned int const bit = TwinFlags[e.at % std::size(TwinFlags)];
        node->SetStreamBaseFlags(e.to % 2 == 1 ? bit : 0, bit);
        break;
    }
    case Op::Name:
        node->SetDisplayName(e.to % 3 == 0 ? node->GetMatchName16Str()
                                           : Q_MBToUTF16String("name " + std::to_string(e.to % 4)));
        break;
    case Op::Independent: node->MakeIndependent(e.to % 2 == 1); break;
    case Op::Value: {
        if (leaves.empty()) break;
        KFS_Stream* const leaf = leaves[e.group % leaves.size()]->GetAsLeaf();
        T_Time const zero{0, leaf->GetTimeScale()};
        double const value = e.to % 6;
        RC_ASSERT(KFS_InsertKeyF(leaf, &zero, 1, &value, 0, 0) == 0);
        break;
    }
    case Op::Throw:
    case Op::End: break;
    }
}

// The lines of a file that a twin can know.
Lines Outline(MemoryFile const& file)
{
    Lines lines;
    for (std::string const& line : file.Lines()) {
        std::size_t const start = line.find_first_not_of(' ');
        std::string const id = line.substr(start, 4), hex = line.size() > start + 5 ? line.substr(start + 5) : "";
        if (id == "LIST") lines.push_back(line);
        if (id == "kfsb")
            lines.push_back(line.substr(0, start) + id + " " + std::to_string(std::stoul(hex, nullptr, 16)));
        if (id != "kfsn" && id != "kfmn") continue;
        std::string text;
        for (std::size_t i = 0; i < hex.size(); i += 2)
            if (char const c = static_cast<char>(std::stoi(hex.substr(i, 2), nullptr, 16))) text += c;
        lines.push_back(line.substr(0, start) + id + " " + text);
    }
    return lines;
}

void Same(std::string const& expected, std::string const& seen)
{
    if (expected != seen) RC_FAIL("twin  " + expected + "\nreal  " + seen);
}
void Same(Lines const& expected, Lines const& seen)
{
    for (std::size_t i = 0; i < std::max(expected.size(), seen.size()); ++i)
        Same(i < expected.size() ? expected[i] : "nothing", i < seen.size() ? seen[i] : "nothing");
}

// Saved, loaded into a new tree and saved again.
void CompareFiles(TwinTree& twin, RealTree& real, ReportRecorder& reports)
{
    bool wasPaused = false;
    EXPECT_EQ(0, KFS_PauseMainListener(true, wasPaused));
    TwinTree loaded;
    loaded.Load(twin.root, loaded.root);
    Lines lines;
    twin.Save(twin.root, "", &lines, false);
    MemoryFile const file([&](CKF_File* out) { real.root.Write(out); });
    Same(lines, Outline(file));
    RealTree other(reports);
    file.Read([&](CKF_File* in) { other.root.Read(in, nullptr); });
    Same(loaded.Show(loaded.root, nullptr, true), other.Show(&other.root, nullptr, true));
    lines.clear();
    loaded.Save(loaded.root, "", &lines, false);
    Same(lines, Outline(MemoryFile([&](CKF_File* out) { other.root.Write(out); })));
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
            if (kind.shape == 'n')
                Get_VX_StreamFactory()
                    ->GetCanonicalStream(Name(kind.name))
                    ->GetAsNamedGroup()
                    ->EnsureUILayoutComplete();
        Run({{{Op::Append, 0, 0, 4}, 0, {}}, {{Op::Append, 0, 0, 5}, 0, {}}});  // fills in what is filled in once
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
    std::vector<Step> const scripts[] = {
        // the list becomes shorter, or loses the stream, before it is changed
        {{{Op::Append, 0, 0, 0}, 0, {}}, {{Op::Insert, 0, 1, 0}, 1, {Op::Remove, 0, 0, 0}}},
        {{{Op::Append, 0, 0, 0}, 0, {}},
         {{Op::Append, 0, 0, 0}, 0, {}},
         {{Op::Insert, 0, 0, 0}, 1, {Op::Remove, 0, 0, 0}}},
        {{{Op::Append, 0, 0, 0}, 0, {}}, {{Op::Remove, 0, 0, 0}, 3, {Op::Remove, 0, 0, 0}}},
        {{{Op::Append, 0, 0, 0}, 0, {}}, {{Op::Swap, 0, 0, 0}, 5, {Op::Remove, 0, 0, 0}}},
        // the slot is made real, or canonical again, by somebody else
        {{{Op::Append, 0, 0, 4}, 0, {}}, {{Op::Upgrade, 0, 0, 0}, 5, {Op::Upgrade, 0, 0, 0}}},
        {{{Op::Append, 0, 0, 4}, 0, {}}, {{Op::Upgrade, 0, 0, 0}, 6, {Op::Canonical, 0, 0, 0}}},
        {{{Op::Append, 0, 0, 4}, 0, {}}, {{Op::RemoveChild, 0, 1, 1}, 4, {Op::SwapNamed, 0, 1, 0}}},
    };
    for (std::vector<Step> const& script : scripts) Run(script);
}

}  // namespace
