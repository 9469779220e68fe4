#include "host/kinds.h"

#include "frame/frame.h"
#include "frame/services/strings.h"
#include "host/names.h"
#include "host/storeerror.h"
#include "keystore/edit.h"

#include <utility>

namespace kfshost {

namespace {

KFS_MatchName const& NameOfScenes()
{
    static KFS_MatchName const name("KFS Scene", true);
    return name;
}
KFS_MatchName const& NameOfAnimations()
{
    static KFS_MatchName const name("KFS Animation", true);
    return name;
}
KFS_MatchName const& NameOfNodes()
{
    static KFS_MatchName const name("KFS Node", true);
    return name;
}

// A leaf that nothing moves stands at this value. Where a file gives a stream another dimension it has that one.
struct LeafKind {
    StreamKind kind;
    char const* matchName;
    short dimension;
    std::array<double, 4> value;
};

constexpr LeafKind LeafKinds[] = {
    {StreamKind::Translation, "KFS Translation", 3, {}},
    {StreamKind::Rotation, "KFS Rotation", 4, {0.0, 0.0, 0.0, 1.0}},
    {StreamKind::Scale, "KFS Scale", 3, {1.0, 1.0, 1.0}},
    {StreamKind::Weights, "KFS Weights", 1, {}},
    {StreamKind::Angles, "KFS Angles", 3, {}},
};
static_assert(std::size(LeafKinds) == std::size(AllStreamKinds));

KFS_MatchName MatchNameOf(StreamKind kind)
{
    return {LeafKinds[static_cast<std::size_t>(kind)].matchName, true};
}

// A plain KFS_Stream, so that it takes its dimension from the file.
KFS_StreamBase* MakeLeaf(LeafKind const& kind, KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant,
                         unsigned int timeScale, bool canonical)
{
    KFS_ValueDesc description;
    description.dataType = KFS_Type_Double;
    auto leaf = std::make_unique<KFS_Stream>(kind.dimension, timeScale, constant, false, KFS_InterpMask_All, 0,
                                             description, &name, factory, canonical);
    leaf->pSetDisplayName(Q_AsciiToUTF16String(kind.matchName));
    T_Time const start{0, timeScale};
    if (int const code = KFS_InsertKeyF(leaf.get(), &start, 1, kind.value.data(), 0, 0)) throw int{code};
    return leaf.release();
}

// Appends a new group of a kind, which a tree doesn't take before it is in it.
template <class Group>
Group& Append(KFS_IndexedStreamGroup& parent, std::string const& name)
{
    auto made = std::make_unique<Group>(parent.GetFactory(), false);
    Group& group = *made;
    group.SetDisplayName(Q_MBToUTF16String(name));
    Q_ScAutoPtr<KFS_StreamBase> stream(made.release());
    parent.AppendStream(&stream);
    return group;
}

template <class Group>
KFS_StreamBase* MakeGroup(KFS_MatchName const&, KFS_StreamFactory* factory, bool, unsigned int, bool canonical)
{
    return new Group(factory, canonical);
}

}  // namespace

// ---- nodes

NodeGroup::NodeGroup(KFS_StreamFactory* factory, bool canonical)
    : KFS_NamedStreamGroup(&NameOfNodes(), factory, canonical)
{}

NodeGroup::NodeGroup(NodeGroup const& source, KFS_CloneStreamParams const& params)
    : KFS_NamedStreamGroup(source, params),
      facts_(source.facts_)
{}

KFS_StreamBase* NodeGroup::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new NodeGroup(*this, params);
}

void NodeGroup::FillCanonicalLayout(KFS_CanonicalLayout* layout)
{
    for (StreamKind const kind : AllStreamKinds) layout->push_back(GetFactory()->GetCanonicalStream(MatchNameOf(kind)));
}

void NodeGroup::FillInDisplayName() const
{
    pSetDisplayName(Q_AsciiToUTF16String("Node"));
}

KFS_Stream const* NodeGroup::FindChannel(StreamKind kind) const
{
    KFS_StreamBase const* const leaf = GetEditableStreamNullOK(MatchNameOf(kind));
    return leaf ? leaf->GetAsLeaf() : nullptr;
}

void NodeGroup::PutChannel(StreamKind kind, std::unique_ptr<KFS_Stream> stream)
{
    stream->SetMatchName(MatchNameOf(kind));
    Q_ScAutoPtr<KFS_StreamBase> incoming(stream.release());
    SwapStream(&incoming);
}

std::unique_ptr<KFS_Stream> NodeGroup::TakeChannel(StreamKind kind)
{
    KFS_StreamBase* const leaf = SwapCanonicalForStream(MatchNameOf(kind));
    return std::unique_ptr<KFS_Stream>(leaf ? leaf->GetAsLeaf() : nullptr);
}

// ---- animations

AnimationGroup::AnimationGroup(KFS_StreamFactory* factory, bool canonical)
    : KFS_IndexedStreamGroup(&NameOfAnimations(), factory, canonical)
{}

AnimationGroup::AnimationGroup(AnimationGroup const& source, KFS_CloneStreamParams const& params)
    : KFS_IndexedStreamGroup(source, params)
{}

KFS_StreamBase* AnimationGroup::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new AnimationGroup(*this, params);
}

void AnimationGroup::FillCanonicalLayout(KFS_CanonicalLayout* layout)
{
    layout->push_back(GetFactory()->GetCanonicalStream(NameOfNodes()));
}

void AnimationGroup::FillInDisplayName() const
{
    pSetDisplayName(Q_AsciiToUTF16String("Animation"));
}

NodeGroup& AnimationGroup::AppendNode(std::string const& name)
{
    return Append<NodeGroup>(*this, name);
}

// ---- the scene

SceneGroup::SceneGroup(KFS_StreamFactory* factory, bool canonical)
    : KFS_IndexedStreamGroup(&NameOfScenes(), factory, canonical)
{}

SceneGroup::SceneGroup(SceneGroup const& source, KFS_CloneStreamParams const& params)
    : KFS_IndexedStreamGroup(source, params),
      times(source.times)
{}

KFS_StreamBase* SceneGroup::CloneStream(KFS_CloneStreamParams const& params) const
{
    return new SceneGroup(*this, params);
}

void SceneGroup::FillCanonicalLayout(KFS_CanonicalLayout* layout)
{
    layout->push_back(GetFactory()->GetCanonicalStream(NameOfAnimations()));
}

void SceneGroup::FillInDisplayName() const
{
    pSetDisplayName(Q_AsciiToUTF16String("Scene"));
}

AnimationGroup& SceneGroup::AppendAnimation(std::string const& name)
{
    return Append<AnimationGroup>(*this, name);
}

std::string DisplayNameOf(KFS_StreamBase const& node)
{
    return CleanName(Q_UTF16ToMBString(node.GetDisplayName()));
}

// ---- registration

// Children before the groups whose layouts name them.
SceneKinds::SceneKinds() : batch_(Get_VX_StreamFactory())
{
    for (LeafKind const& kind : LeafKinds) {
        batch_.Register(
            MatchNameOf(kind.kind),
            [&kind](KFS_MatchName const& name, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
                    bool canonical) { return MakeLeaf(kind, name, factory, constant, timeScale, canonical); },
            false);
    }
    batch_.Register(NameOfNodes(), MakeGroup<NodeGroup>, false);
    batch_.Register(NameOfAnimations(), MakeGroup<AnimationGroup>, false);
    batch_.Register(NameOfScenes(), MakeGroup<SceneGroup>, false);
}

SceneKinds::~SceneKinds()
{
    batch_.UnregisterAll();
}

}  // namespace kfshost
