#pragma once

#include "frame/services/scoped.h"
#include "tree/streamgroup.h"

#include <atomic>

// A group whose children are fixed by its type: each instance has exactly one child for each slot of the layout. A slot
// that nobody has edited holds the canonical instance of its match name; GetEditableStream replaces it by a real stream
// on first demand. Slots that are groups are real from the beginning, one level down.
//
// Positions are positions in the layout, the display order, except where a sorted index is spoken of: the children are
// kept sorted by match name, an order that means nothing to users.
//
// Listeners may edit the group from inside its notifications (KFS_StreamListener); the slot is then looked for again.
// Where one throws, or the stream that comes can't take the group's time scale, the slot has that stream if the edit
// had got so far: an upgrade isn't undone.
//
// A canonical group's children are filled in when somebody first looks, once, under a process-wide lock; any thread may
// look.
class KFS_API KFS_NamedStreamGroup : public KFS_StreamGroup {
public:
    // Complete from here on, if the type's canonical instance has its layout.
    KFS_NamedStreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical);
    // Clones the real children, and keeps the canonical ones.
    KFS_NamedStreamGroup(KFS_NamedStreamGroup const& source, KFS_CloneStreamParams const& params);
    ~KFS_NamedStreamGroup() override;

    bool IsNamedGroup() const override;
    KFS_NamedStreamGroup const* GetAsNamedGroup() const override;
    KFS_NamedStreamGroup* GetAsNamedGroup() override;
    // What identifies everything below that can change what the options' span renders; equal ones render alike. Real
    // copies are made of the canonical children on the way, without a lock. Throws an int.
    hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const& options,
                                        GetRenderGuidFilter* filter) const override;
    void SetupCanonicalLayout() override;

    // A canonical group that nobody has looked into has none yet.
    unsigned int GetNumStreams() const override;
    KFS_StreamBase* GetEditableStream(unsigned int index) override;
    KFS_StreamBase const* GetStream(unsigned int index) const override;
    KFS_StreamBase* GetEditableStreamNullOK(unsigned int index) override;
    KFS_StreamBase const* GetEditableStreamNullOK(unsigned int index) const override;
    // By index if the identifier has one, and then its match name, if valid, must be the child's; else by match name.
    KFS_StreamBase const* GetStream(KFS_StreamID const& id) const override;
    KFS_StreamBase* GetEditableStream(KFS_StreamID const& id) override;
    void ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk) override;
    // The child's match name, without an index.
    KFS_StreamID SlowGetIDOfChild(KFS_StreamBase const* child) const override;
    // Leaves the slot without an entry. Listeners are told the sorted index. False too if one of them took the child.
    bool RemoveChild(KFS_StreamBase* child) override;

    // The name must be one of the layout's, except where said otherwise. What a listener put into the slot before the new
    // stream came is deleted; a slot that one of them has made canonical again is a broken invariant.
    virtual KFS_StreamBase* GetEditableStream(KFS_MatchName const& name);
    virtual KFS_StreamBase* GetEditableStreamNullOK(KFS_MatchName const& name);
    virtual KFS_StreamBase const* GetEditableStreamNullOK(KFS_MatchName const& name) const;
    // With `mustExist` false an unknown name gives null.
    virtual KFS_StreamBase const* GetStream(KFS_MatchName const& name, bool mustExist) const;
    // The three for leaves: null if the child is a group, and from the middle one while it is canonical.
    virtual KFS_Stream* GetEditableLeafStream(KFS_MatchName const& name);
    virtual KFS_Stream* GetEditableLeafStreamNullOK(KFS_MatchName const& name);
    virtual KFS_Stream const* GetLeafStream(KFS_MatchName const& name) const;
    // Puts `*stream` into the slot of its match name, and returns the real stream that was there behind the first
    // notification, which is the caller's now, or null. A group without a layout takes nothing and returns null. Listeners hear of the stream that came,
    // then of the one that left.
    virtual KFS_StreamBase* SwapStream(Q_ScAutoPtr<KFS_StreamBase>* stream);
    // Makes the slot canonical again. Returns the real stream that was there, the caller's now, or null if there was
    // none.
    virtual KFS_StreamBase* SwapCanonicalForStream(KFS_MatchName const& name);
    virtual bool IsModifiedByName(KFS_MatchName const& name) const;
    virtual bool UserCanHideAndShowChildren(KFS_MatchName const& name) const;

    // Drops all children, takes the layout that the type's canonical instance has now, and fills the slots with it. A
    // canonical group does it with `force` only.
    void ResetAllStreamsToCanonical(bool force);
    void FillInStreamsFromCanonicalLayout();
    // Fills a canonical group's children in if they aren't yet.
    void EnsureUILayoutComplete() const;
    // Clones into this group those real children of `other` whose name has a slot here.
    void CopyAcceptableStreams(KFS_NamedStreamGroup const& other);

protected:
    // Removes and deletes all real children, one by one, and forgets the canonical ones.
    void DestroyContents();

private:
    using Streams = KFS_GroupChildren;

    Streams::const_iterator LookupStream(KFS_MatchName const& name, bool mustExist) const;
    Streams::iterator LookupStream(KFS_MatchName const& name, bool mustExist);
    bool IsAsInLayout(unsigned int position) const;
    Streams::const_iterator LookupStreamAt(unsigned int index) const;
    Streams::const_iterator Find(KFS_MatchName const& name) const;
    Streams::const_iterator Entered(Streams::const_iterator found) const;
    KFS_MatchName const& NameAt(unsigned int index, std::size_t count) const;
    bool IsComplete() const;
    void MakeSubgroupsReal();
    KFS_StreamBase* DefaultFor(KFS_MatchName const& name) const;
    void DeleteRealStreams() noexcept;

    Streams streams_;  // sorted by match name
    // The layout that streams_ was made from. Readers of a canonical group look at streams_ only after they have seen
    // it here.
    std::atomic<KFS_CanonicalLayout const*> filledFrom_{nullptr};
};
