#include "host/kinds.h"

#include "frame/frame.h"
#include "frame/services/reports.h"
#include "frame/services/strings.h"
#include "host/channelstream.h"
#include "host/names.h"
#include "keystore/expstate.h"

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

KFS_Stream const* NodeGroup::FindFollower(StreamKind kind, int dimension) const
{
    if (kind != StreamKind::Translation || dimension < 0 || dimension >= UsualDimension(kind)) return nullptr;
    KFS_StreamBase const* const leaf = GetEditableStreamNullOK(FollowerNameOf(kind, dimension));
    return leaf ? leaf->GetAsLeaf() : nullptr;
}

void NodeGroup::PutChannel(StreamKind kind, std::unique_ptr<KFS_Stream> stream)
{
    Q_ScAutoPtr<KFS_StreamBase> incoming(AsChannel(kind, std::move(stream)).release());
    SwapStream(&incoming);
}

void NodeGroup::PutFollower(std::unique_ptr<KFS_Stream> follower)
{
    Q_ScAutoPtr<KFS_StreamBase> incoming(follower.release());
    Q_ScAutoPtr<KFS_StreamBase> const replaced(SwapStream(&incoming));
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
      times(source.times),
      frameRate(source.frameRate)
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

int SceneGroup::EvaluateExpression(KFS_Stream const* stream, T_Time const* time, double* values, void**,
                                   KFS_ParamBag const* bag)
try {
    Q_RenderContext const* const context = Q_RenderContext::PeekCurrent();
    auto* const state = context ? dynamic_cast<KFS_ExpState*>(context->PeekState(KFS_ExpState::S_StateName)) : nullptr;
    if (!state || !stream->GetKeyData()->stream->HasActiveExpression()) return 1;
    unsigned int const scale = stream->GetKeyData()->stream->GetTimeScale();
    int at = 0;
    if (int const code = time ? T_ShortConvTime(time->value, time->scale, scale, &at) : 0) return code;
    state->EvalExprValueF(stream, at, 0, values, bag);
    return 0;
} catch (int code) {
    return code;
} catch (std::exception& exception) {
    return Q_TranslateAndReportException(exception);
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
    for (StreamKind const kind : AllStreamKinds) {
        batch_.Register(
            MatchNameOf(kind),
            [kind](KFS_MatchName const&, KFS_StreamFactory* factory, bool constant, unsigned int timeScale,
                   bool canonical) -> KFS_StreamBase* {
                return new ChannelStream(kind, UsualDimension(kind), timeScale, StreamForm::Curves, constant, factory,
                                         canonical);
            },
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
