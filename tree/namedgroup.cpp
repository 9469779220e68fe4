#include "tree/namedgroup.h"

#include "frame/errors.h"
#include "frame/statics_private.h"
#include "tree/decanonicalize.h"
#include "tree/factory.h"
#include "tree/groupsupport_private.h"
#include "tree/layoutorder_private.h"
#include "tree/leafhooks_private.h"

#include <algorithm>
#include <utility>

using hearth::threads::ScRecursiveLock;

namespace {

// The order of a named group's children.
struct KFSp_StreamMatchNameCompare {
    bool operator()(KFS_StreamBase const* a, KFS_StreamBase const* b) const
    {
        return a->GetMatchName() < b->GetMatchName();
    }
    bool operator()(KFS_StreamBase const* a, KFS_MatchName const& b) const { return a->GetMatchName() < b; }
    bool operator()(KFS_MatchName const& a, KFS_StreamBase const* b) const { return a < b->GetMatchName(); }
};

KFS_CloneStreamParams constexpr WholeClone{true, true};

}  // namespace

KFS_NamedStreamGroup::KFS_NamedStreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical)
    : KFS_StreamGroup(name, factory, canonical)
{
    try {
        ResetAllStreamsToCanonical(true);
    } catch (...) {
        DeleteRealStreams();
        throw;
    }
}

KFS_NamedStreamGroup::KFS_NamedStreamGroup(KFS_NamedStreamGroup const& source, KFS_CloneStreamParams const& params)
    : KFS_StreamGroup(source)
{
    source.EnsureUILayoutComplete();
    streams_ = KFSp_CloneChildren(source.streams_, params);
    pAdopt(streams_);
    filledFrom_ = source.filledFrom_.load();
}

KFS_NamedStreamGroup::~KFS_NamedStreamGroup()
{
    try {
        DestroyContents();
    } catch (...) {
        // A listener's failure; the children that it kept go now.
        DeleteRealStreams();
    }
}

bool KFS_NamedStreamGroup::IsNamedGroup() const
{
    return true;
}

KFS_NamedStreamGroup const* KFS_NamedStreamGroup::GetAsNamedGroup() const
{
    return this;
}

KFS_NamedStreamGroup* KFS_NamedStreamGroup::GetAsNamedGroup()
{
    return this;
}

// A new layout may lie where one lay that the children were once made from.
void KFS_NamedStreamGroup::SetupCanonicalLayout()
{
    KFS_StreamGroup::SetupCanonicalLayout();
    filledFrom_ = nullptr;
}

unsigned int KFS_NamedStreamGroup::GetNumStreams() const
{
    return IsCanonical() && !IsComplete() ? 0 : static_cast<unsigned int>(streams_.size());
}

KFS_StreamBase* KFS_NamedStreamGroup::GetEditableStream(unsigned int index)
{
    // Reads of separated dimensions come this way, and what is real needs no look-up.
    if (IsComplete() && index < streams_.size()) [[likely]] {
        KFS_StreamBase* const child = streams_[layoutOrder_->SlotOf(index)];
        if (!child->IsCanonical()) return child;
    }
    return GetEditableStream(NameAt(index, GetNumStreams()));
}

KFS_StreamBase const* KFS_NamedStreamGroup::GetStream(unsigned int index) const
{
    return *LookupStreamAt(index);
}

KFS_StreamBase* KFS_NamedStreamGroup::GetEditableStreamNullOK(unsigned int index)
{
    if (IsAsInLayout(index)) return nullptr;
    return const_cast<KFS_StreamBase*>(std::as_const(*this).GetEditableStreamNullOK(index));
}

KFS_StreamBase const* KFS_NamedStreamGroup::GetEditableStreamNullOK(unsigned int index) const
{
    if (IsAsInLayout(index)) return nullptr;
    KFS_StreamBase const* const child = *LookupStreamAt(index);
    return child->IsCanonical() ? nullptr : child;
}

KFS_StreamBase const* KFS_NamedStreamGroup::GetStream(KFS_StreamID const& id) const
{
    if (id.GetIndex() == KFS_StreamID::NoIndex) return GetStream(id.GetMatchName(), true);
    KFS_StreamBase const* const child = GetStream(id.GetIndex());
    KFSp_ValidateMatchNames(id, child);
    return child;
}

KFS_StreamBase* KFS_NamedStreamGroup::GetEditableStream(KFS_StreamID const& id)
{
    if (id.GetIndex() == KFS_StreamID::NoIndex) return GetEditableStream(id.GetMatchName());
    KFS_MatchName const& name = NameAt(id.GetIndex(), GetNumStreams());
    KFSp_ValidateMatchNames(id, *LookupStream(name, true));  // before anything is made real
    return GetEditableStream(name);
}

KFS_StreamID KFS_NamedStreamGroup::SlowGetIDOfChild(KFS_StreamBase const* child) const
{
    return KFS_StreamID(child->GetMatchName());
}

bool KFS_NamedStreamGroup::RemoveChild(KFS_StreamBase* child)
{
    bool const removed = KFSp_RemoveChild(this, &streams_, child);
    if (removed) filledFrom_ = nullptr;
    return removed;
}

KFS_StreamBase* KFS_NamedStreamGroup::GetEditableStream(KFS_MatchName const& name)
{
    KFS_StreamBase* const child = *LookupStream(name, true);
    if (!child->IsCanonical()) return child;
    KFS_MatchName const kind = name;  // which may be that of a stream that goes meanwhile
    Q_ScAutoPtr<KFS_StreamBase> created(CreateStream(kind, true, 600, true, false));
    KFS_StreamBase const* const stream = created.get();
    if (!stream) throw int{KFS_Err_UnknownStream};
    // A listener may have made the slot real by itself, and also take what has come.
    Q_ScAutoPtr<KFS_StreamBase> const replaced(SwapStream(&created));
    KFS_StreamBase* const stored = *LookupStream(kind, true);
    if (stored->IsCanonical()) KFSp_FailVerification("unexpected match name searched for in group");
    if (KFS_Stream* const leaf = stored->GetAsLeaf(); leaf && stored == stream) KFSp_ResetAfterStored(leaf);
    return stored;
}

KFS_StreamBase* KFS_NamedStreamGroup::GetEditableStreamNullOK(KFS_MatchName const& name)
{
    return const_cast<KFS_StreamBase*>(std::as_const(*this).GetEditableStreamNullOK(name));
}

KFS_StreamBase const* KFS_NamedStreamGroup::GetEditableStreamNullOK(KFS_MatchName const& name) const
{
    KFS_StreamBase const* const child = *LookupStream(name, true);
    return child->IsCanonical() ? nullptr : child;
}

KFS_StreamBase const* KFS_NamedStreamGroup::GetStream(KFS_MatchName const& name, bool mustExist) const
{
    auto const found = LookupStream(name, mustExist);
    return found == streams_.end() ? nullptr : *found;
}

KFS_Stream* KFS_NamedStreamGroup::GetEditableLeafStream(KFS_MatchName const& name)
{
    return GetEditableStream(name)->GetAsLeaf();
}

KFS_Stream* KFS_NamedStreamGroup::GetEditableLeafStreamNullOK(KFS_MatchName const& name)
{
    KFS_StreamBase* const child = GetEditableStreamNullOK(name);
    return child ? child->GetAsLeaf() : nullptr;
}

KFS_Stream const* KFS_NamedStreamGroup::GetLeafStream(KFS_MatchName const& name) const
{
    return GetStream(name, true)->GetAsLeaf();
}

KFS_StreamBase* KFS_NamedStreamGroup::SwapStream(Q_ScAutoPtr<KFS_StreamBase>* stream)
{
    if (!GetLayout()) return nullptr;
    KFS_StreamBase* const incoming = stream->get();
    KFS_MatchName const& name = incoming->GetMatchName();
    if (!CanStore(name)) KFSp_FailVerification("invalid name for storing in this named group");
    static_cast<void>(LookupStream(name, true));
    unsigned int const index = GetIndexInUILayout(name);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamAboutToBeSwapped, this, incoming, index);
    auto const slot = LookupStream(name, true);
    KFS_StreamBase* const outgoing = std::exchange(*slot, stream->release());
    // Whatever throws from here on, the group has the stream that came, and the one that left must not be lost.
    Q_ScAutoPtr<KFS_StreamBase> leaving(outgoing->IsCanonical() ? nullptr : outgoing);
    if (!incoming->IsCanonical()) incoming->SetParent(this);
    if (outgoing->GetParent()) outgoing->SetParent(nullptr);
    KFSp_NotifyOfSwap(this, streams_, incoming, outgoing, index);
    return leaving.release();
}

KFS_StreamBase* KFS_NamedStreamGroup::SwapCanonicalForStream(KFS_MatchName const& name)
{
    if ((*LookupStream(name, true))->IsCanonical()) return nullptr;
    KFS_MatchName const kind = name;  // which may be that of the stream that leaves
    KFSp_ScIncoming incoming(GetCanonicalStream(kind));
    if (!incoming.stream) KFSp_FailVerification("unexpected match name searched for in group");
    Q_ScAutoPtr<KFS_StreamBase> leaving(SwapStream(&incoming.stream));
    if (KFS_ShouldAlwaysDecanonicalize()) GetEditableStream(kind);
    return leaving.release();
}

bool KFS_NamedStreamGroup::IsModifiedByName(KFS_MatchName const& name) const
{
    return GetStream(name, true)->IsModified();
}

bool KFS_NamedStreamGroup::UserCanHideAndShowChildren(KFS_MatchName const&) const
{
    return false;
}

void KFS_NamedStreamGroup::ResetAllStreamsToCanonical(bool force)
{
    if (IsCanonical() && !force) return;
    DestroyContents();
    ShareLayoutOf(GetMatchName());
    FillInStreamsFromCanonicalLayout();
}

void KFS_NamedStreamGroup::FillInStreamsFromCanonicalLayout()
{
    if (!GetLayout()) return;
    DestroyContents();
    streams_.assign(layoutOrder_->Slots().begin(), layoutOrder_->Slots().end());
    if (!IsCanonical()) MakeSubgroupsReal();
    filledFrom_.store(GetLayout().get(), std::memory_order_release);
}

// A slot that is a group holds a clone of the canonical group, whose own children are canonical.
void KFS_NamedStreamGroup::MakeSubgroupsReal()
{
    for (unsigned int const position : layoutOrder_->Subgroups()) {
        KFS_StreamBase*& slot = streams_[layoutOrder_->SlotOf(position)];
        if (!slot->IsCanonical()) continue;  // somebody who was told of an earlier one has asked for it
        KFS_StreamBase* const clone = slot->CloneStream(WholeClone);
        clone->SetCanonical(false);
        slot = clone;
        clone->SetParent(this);
    }
}

bool KFS_NamedStreamGroup::IsComplete() const
{
    KFS_CanonicalLayout const* const filledFrom = filledFrom_.load(std::memory_order_acquire);
    return filledFrom && filledFrom == GetLayout().get();
}

void KFS_NamedStreamGroup::EnsureUILayoutComplete() const
{
    if (!IsCanonical() || !GetLayout() || IsComplete()) return;
    ScRecursiveLock const guard(KFSp_GetCanonicalLock());
    if (!IsComplete()) const_cast<KFS_NamedStreamGroup*>(this)->FillInStreamsFromCanonicalLayout();
}

void KFS_NamedStreamGroup::CopyAcceptableStreams(KFS_NamedStreamGroup const& other)
{
    for (KFS_StreamBase const* const child : other.streams_) {
        if (child->IsCanonical() || Find(child->GetMatchName()) == streams_.end()) continue;
        Q_ScAutoPtr<KFS_StreamBase> clone(child->CloneStream(WholeClone));
        Q_ScAutoPtr<KFS_StreamBase> const replaced(SwapStream(&clone));
    }
}

void KFS_NamedStreamGroup::DestroyContents()
{
    filledFrom_ = nullptr;
    if (IsCanonical()) {
        streams_.clear();  // all are the factory's, and may be gone before this group
        return;
    }
    for (unsigned int i = 0; i < streams_.size(); ++i) {
        KFS_StreamBase* const child = streams_[i];
        if (child->IsCanonical()) continue;
        KFSp_NotifyOfChild(&KFS_StreamListener::StreamAboutToBeRemoved, this, child, i);
        unsigned int const place = KFSp_PlaceOf(streams_, child);
        if (place == streams_.size()) continue;
        child->SetParent(nullptr);
        KFSp_NotifyOfChild(&KFS_StreamListener::StreamRemoved, this, child, place);
        auto const slot = KFSp_FindChild(streams_, child);
        if (slot == streams_.end()) continue;  // a listener has it
        // A listener of what is still to come may look at this group.
        *slot = DefaultFor(child->GetMatchName());
        delete child;
    }
    DeleteRealStreams();  // what a listener has made real meanwhile
}

// The canonical child of that name. A child whose name is none of the type's, because somebody changed it, leaves
// its place to any of them.
KFS_StreamBase* KFS_NamedStreamGroup::DefaultFor(KFS_MatchName const& name) const
{
    return const_cast<KFS_StreamBase*>((*GetLayout())[FindPosition(name).value_or(0)]);
}

void KFS_NamedStreamGroup::DeleteRealStreams() noexcept
{
    if (IsCanonical())
        streams_.clear();
    else
        KFSp_DeleteChildren(&streams_);
}

KFS_NamedStreamGroup::Streams::const_iterator KFS_NamedStreamGroup::LookupStream(KFS_MatchName const& name,
                                                                                 bool mustExist) const
{
    EnsureUILayoutComplete();
    auto const found = Find(name);
    if (found == streams_.end()) {
        if (mustExist) KFSp_FailVerification("unexpected match name searched for in group");
        return found;
    }
    return Entered(found);
}

// Who is given a canonical group may look inside.
KFS_NamedStreamGroup::Streams::const_iterator KFS_NamedStreamGroup::Entered(Streams::const_iterator found) const
{
    bool const hasLeavesOnly = layoutOrder_ && layoutOrder_->Subgroups().empty();
    if (!hasLeavesOnly && (*found)->IsCanonical()) {
        if (KFS_NamedStreamGroup const* const group = std::as_const(**found).GetAsNamedGroup())
            group->EnsureUILayoutComplete();
    }
    return found;
}

// The children of a real group are complete.
KFS_NamedStreamGroup::Streams::iterator KFS_NamedStreamGroup::LookupStream(KFS_MatchName const& name, bool mustExist)
{
    auto const found = std::as_const(*this).LookupStream(name, mustExist);
    return streams_.begin() + (found - streams_.cbegin());
}

// Most slots are, and it shows without a look at the stream. False says nothing.
bool KFS_NamedStreamGroup::IsAsInLayout(unsigned int position) const
{
    if (!IsComplete() || position >= streams_.size()) return false;
    unsigned int const slot = layoutOrder_->SlotOf(position);
    return streams_[slot] == layoutOrder_->Slots()[slot];
}

KFS_NamedStreamGroup::Streams::const_iterator KFS_NamedStreamGroup::LookupStreamAt(unsigned int index) const
{
    KFS_MatchName const& name = NameAt(index, GetLayout() ? GetLayout()->size() : 0);
    EnsureUILayoutComplete();
    return IsComplete() ? Entered(streams_.begin() + layoutOrder_->SlotOf(index)) : LookupStream(name, true);
}

// Where nothing is missing the order of the type says where a name stands.
KFS_NamedStreamGroup::Streams::const_iterator KFS_NamedStreamGroup::Find(KFS_MatchName const& name) const
{
    if (IsComplete()) {
        unsigned int const slot = layoutOrder_->Find(name);
        return slot == KFSp_LayoutOrder::None ? streams_.end() : streams_.begin() + slot;
    }
    auto const [first, last] = std::equal_range(streams_.begin(), streams_.end(), name, KFSp_StreamMatchNameCompare());
    return first == last ? streams_.end() : first;
}

KFS_MatchName const& KFS_NamedStreamGroup::NameAt(unsigned int index, std::size_t count) const
{
    if (index >= count) KFSp_FailVerification("invalid index in named group");
    return (*GetLayout())[index]->GetMatchName();
}
