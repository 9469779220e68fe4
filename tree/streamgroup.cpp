#include "tree/streamgroup.h"

#include "frame/services/scoped.h"
#include "frame/statics_private.h"
#include "tree/factory.h"
#include "tree/layoutorder_private.h"
#include "tree/verify_private.h"

#include <boost/make_shared.hpp>

#include <algorithm>
#include <utility>

namespace {

// Whether `is` holds for a child. A canonical group isn't entered: nobody has edited it, and it may contain itself.
template <class Question>
bool AnyChild(KFS_StreamGroup const* group, Question const& is)
{
    for (unsigned int i = 0; i < group->GetNumStreams(); ++i) {
        KFS_StreamBase const* const child = group->GetStream(i);
        if (!(child->IsCanonical() && child->IsGroup()) && is(child)) return true;
    }
    return false;
}

// Walks down `path` with `step`, which gives a group's child for an identifier.
template <class Base, class Group, class Step>
Base* Walk(Group* group, KFS_StreamIDPath const& path, Step const& step)
{
    Base* found = group;
    for (KFS_StreamID const& id : path.GetPathConst()) {
        Group* const current = found->GetAsGroup();
        if (!current) KFSp_FailVerification("expected group");
        found = step(current, id);
        if (!found) return nullptr;
    }
    return found;
}

}  // namespace

KFS_StreamGroup::KFS_StreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical)
    : KFS_StreamBase(name, factory, canonical)
{
    FX_ParamDef def{};
    def.paramType = FX_Param_GROUP;
    SetParamDef(def);
    if (name) ShareLayoutOf(*name);
}

KFS_StreamGroup::KFS_StreamGroup(KFS_StreamGroup const& source) = default;

bool KFS_StreamGroup::IsModified() const
{
    return AnyChild(
        this, [](KFS_StreamBase const* child) { return child->IsModified(); });
}

bool KFS_StreamGroup::IsAnimated(bool evenIfDisabled) const
{
    return AnyChild(
        this, [=](KFS_StreamBase const* child) { return child->IsAnimated(evenIfDisabled); });
}

bool KFS_StreamGroup::IsGroup() const
{
    return true;
}

bool KFS_StreamGroup::IsLoading() const
{
    KFS_StreamGroup const* const root = GetRoot();
    return root && root->IsLoading();
}

KFS_StreamGroup* KFS_StreamGroup::GetAsGroup()
{
    return this;
}

KFS_StreamGroup const* KFS_StreamGroup::GetAsGroup() const
{
    return this;
}

bool KFS_StreamGroup::AffectsRendering(KFS_RenderOptionsBase const&) const
{
    return true;
}

void KFS_StreamGroup::GetExpressionDependencyIds(std::set<int>& ids) const
{
    for (unsigned int i = 0; i < GetNumStreams(); ++i) {
        KFS_StreamBase const* const child = GetStream(i);
        if (!child) continue;
        std::set<int> childs;
        child->GetExpressionDependencyIds(childs);
        ids.insert(childs.begin(), childs.end());
    }
}

void KFS_StreamGroup::MakeIndependent(bool independent)
{
    if (IsIndependent() == independent) return;
    for (unsigned int i = 0; i < GetNumStreams(); ++i)
        if (!GetStream(i)->IsCanonical()) GetEditableStream(i)->MakeIndependent(independent);
    SetStreamBaseFlags(independent ? KFS_BaseFlag_Independent : 0U, KFS_BaseFlag_Independent);
}

void KFS_StreamGroup::SetupCanonicalLayout()
{
    auto const layout = boost::make_shared<KFS_CanonicalLayout>();
    FillCanonicalLayout(layout.get());
    if (std::find(layout->begin(), layout->end(), nullptr) != layout->end())
        KFSp_FailVerification("UI layout has an unregistered child");
    if (GetFactory()) GetFactory()->SetupCanonicalLayoutForSeperatedDimensions(layout.get());
    SetLayout(layout);
}

void KFS_StreamGroup::UpgradeChildStream(KFS_StreamBase*) {}

bool KFS_StreamGroup::CanStore(KFS_MatchName const& name) const
{
    return FindPosition(name).has_value();
}

void KFS_StreamGroup::NotifyStreamStored(KFS_StreamGroup*, KFS_StreamBase*) {}

bool KFS_StreamGroup::CouldGoMissing() const
{
    return false;
}

unsigned int KFS_StreamGroup::GetPreferredTimeScale() const
{
    return GetParent() ? GetParent()->GetPreferredTimeScale() : 600;
}

int KFS_StreamGroup::EvaluateExpression(KFS_Stream const*, T_Time const*, double*, void**, KFS_ParamBag const*)
{
    return 1;
}

unsigned int KFS_StreamGroup::GetIndexInUILayout(KFS_MatchName const& name) const
{
    if (std::optional<unsigned int> const position = FindPosition(name)) return *position;
    KFSp_FailVerification("match name isn't in UI layout");
}

unsigned int KFS_StreamGroup::GetIndexInUILayout(KFS_MatchName const& name, unsigned int guess) const
{
    return layoutOrder_ && layoutOrder_->IsAt(guess, name) ? guess : GetIndexInUILayout(name);
}

std::optional<unsigned int> KFS_StreamGroup::FindPosition(KFS_MatchName const& name) const
{
    unsigned int const slot = layoutOrder_ ? layoutOrder_->Find(name) : KFSp_LayoutOrder::None;
    return slot == KFSp_LayoutOrder::None ? std::nullopt : std::optional(layoutOrder_->PositionOf(slot));
}

void KFS_StreamGroup::SetLayout(boost::shared_ptr<KFS_CanonicalLayout> layout)
{
    layoutOrder_.reset(layout ? new KFSp_LayoutOrder(*layout) : nullptr);
    canonicalLayout_ = std::move(layout);
}

void KFS_StreamGroup::ShareLayoutOf(KFS_MatchName const& name)
{
    KFS_StreamGroup const* const group = FindCanonicalGroup(name);
    layoutOrder_ = group ? group->layoutOrder_ : nullptr;
    canonicalLayout_ = group ? group->canonicalLayout_ : nullptr;
}

KFS_StreamGroup const* KFS_StreamGroup::FindCanonicalGroup(KFS_MatchName const& name) const
{
    KFS_StreamFactory* const factory = GetFactory();
    KFS_StreamBase const* const canonical = factory ? factory->GetCanonicalStream(name) : nullptr;
    return canonical ? canonical->GetAsGroup() : nullptr;
}

boost::shared_ptr<KFS_CanonicalLayout> KFS_StreamGroup::GetCanonicalLayout(KFS_MatchName const& name) const
{
    KFS_StreamGroup const* const group = FindCanonicalGroup(name);
    return group ? group->canonicalLayout_ : nullptr;
}

KFS_StreamBase const* KFS_StreamGroup::FindStream(KFS_StreamIDPath const& path) const
{
    return Walk<KFS_StreamBase const>(
        this, path, [](KFS_StreamGroup const* group, KFS_StreamID const& id) { return group->GetStream(id); });
}

KFS_StreamBase* KFS_StreamGroup::FindEditableStream(KFS_StreamIDPath const& path)
{
    return Walk<KFS_StreamBase>(
        this, path, [](KFS_StreamGroup* group, KFS_StreamID const& id) { return group->GetEditableStream(id); });
}

KFS_Stream* KFS_StreamGroup::FindEditableLeafStreamNullOK(KFS_StreamIDPath const& path)
{
    return const_cast<KFS_Stream*>(std::as_const(*this).FindEditableLeafStreamNullOK(path));
}

KFS_Stream const* KFS_StreamGroup::FindEditableLeafStreamNullOK(KFS_StreamIDPath const& path) const
{
    KFS_StreamBase const* const found = FindStream(path);
    return found && !found->IsCanonical() ? found->GetAsLeaf() : nullptr;
}

bool KFS_StreamGroup::AreLeafDimensionsSeparated(KFS_StreamIDPath const& path) const
{
    KFS_StreamBase const* const found = FindStream(path);
    return found && found->IsLeaf() && found->AreDimensionsSeparated();
}

KFS_StreamIDPath KFS_StreamGroup::GetLeafSeparationPath(KFS_StreamIDPath const& path, int dimension) const
{
    KFS_StreamBase const* const found = FindStream(path);
    KFS_StreamGroup const* const parent = found && found->IsLeaf() ? found->GetParent() : nullptr;
    KFS_StreamIDPath result;
    if (!parent) return result;
    result = path;
    KFS_StreamID const tail = result.RemoveTail();
    unsigned int const index =
        static_cast<unsigned int>(dimension) + parent->GetIndexInUILayout(tail.GetMatchName()) + 1;
    // From the layout, since a child may have been renamed or taken out.
    result.AddTail(KFS_StreamID(index, parent->GetLayout()->at(index)->GetMatchName()));
    return result;
}

void KFS_StreamGroup::NotifyParentsStreamStored(KFS_StreamBase* stream)
{
    boost::thread_specific_ptr<bool>& check = KFSp_GetNotifyParentsCheck();
    if (!check.get()) check.reset(new bool(false));
    if (*check) return;
    Q_ScSetReset<bool> const inside(check.get(), true);
    for (KFS_StreamGroup* group = this; group; group = group->GetParent()) group->NotifyStreamStored(this, stream);
}
