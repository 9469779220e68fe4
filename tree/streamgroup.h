#pragma once

#include "frame/services/memory.h"
#include "tree/streambase.h"
#include "tree/streampath.h"

#include <boost/shared_ptr.hpp>

#include <optional>
#include <vector>

class KFS_ParamBag;
class KFSp_LayoutOrder;
struct T_Time;

// The kinds of children of a group type, in display order, each as its canonical instance.
using KFS_CanonicalLayout = std::vector<KFS_StreamBase const*, Q_Allocator<KFS_StreamBase const*>>;

// A group's children, real and canonical.
using KFS_GroupChildren = std::vector<KFS_StreamBase*, Q_Allocator<KFS_StreamBase*>>;

// An interior node of a stream tree. A root is a group without a parent; hosts derive their root from one of the
// concrete groups.
//
// A group owns exactly those of its children that aren't canonical: a canonical child is the factory's shared default
// instance, stands in many groups at once, and must not be edited. "Editable" look-ups turn it into a real stream of
// this group (they upgrade it), all the others never do. A named group is edited this way; an indexed group holds what
// was put into it.
//
// Errors: a broken invariant is reported by Q_ReportFailedVerification and thrown as the int 3, with the tree as it
// was. Threads: one thread edits a tree. Look-ups that don't upgrade may run beside each other.
class KFS_API KFS_StreamGroup : public KFS_StreamBase {
public:
    // Any child modified; any child animated. Both ask canonical leaves too, and enter no canonical group, which is as
    // its type made it and may contain itself.
    bool IsModified() const override;
    bool IsAnimated(bool evenIfDisabled) const override;
    bool IsGroup() const override;
    // The root's answer; false without a parent. A root overrides it.
    bool IsLoading() const override;
    KFS_StreamGroup* GetAsGroup() override;
    KFS_StreamGroup const* GetAsGroup() const override;
    bool AffectsRendering(KFS_RenderOptionsBase const& options) const override;
    // Adds those of all children to what the set holds.
    void GetExpressionDependencyIds(std::set<int>& ids) const override;
    void Read(CKF_File* file, CKF_ChunkInfo const* parent) override;
    void Write(CKF_File* file) const override;
    // Passes the wish on to the real children, and then takes it itself. A group that is already so does nothing.
    void MakeIndependent(bool independent) override;
    // Asks the group type for its children anew. Instances that exist keep the layout that they have. A kind that isn't
    // registered, a null in the layout, is a broken invariant, "UI layout has an unregistered child".
    void SetupCanonicalLayout() override;

    virtual unsigned int GetNumStreams() const = 0;
    // By position. Upgrades a canonical child.
    virtual KFS_StreamBase* GetEditableStream(unsigned int index) = 0;
    virtual KFS_StreamBase const* GetStream(unsigned int index) const = 0;
    // The child at `index`, or null where a named group's child is still canonical.
    virtual KFS_StreamBase* GetEditableStreamNullOK(unsigned int index) = 0;
    virtual KFS_StreamBase const* GetEditableStreamNullOK(unsigned int index) const = 0;
    virtual KFS_StreamBase const* GetStream(KFS_StreamID const& id) const = 0;
    virtual KFS_StreamBase* GetEditableStream(KFS_StreamID const& id) = 0;
    // A group type that replaces an older kind of stream converts that stream, which stays its caller's, into its own
    // new children.
    virtual void UpgradeChildStream(KFS_StreamBase* obsolete);
    // Makes a child of that name, which a file holds next, and reads it. Throws an int.
    virtual void ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk) = 0;
    // Whether a stream of that name may stand here: whether the layout has it.
    virtual bool CanStore(KFS_MatchName const& name) const;
    // Appends the canonical instances of this group type's children, in display order.
    virtual void FillCanonicalLayout(KFS_CanonicalLayout* layout) = 0;
    // Told, from the parent up, that `stream` now stands in `group`.
    virtual void NotifyStreamStored(KFS_StreamGroup* group, KFS_StreamBase* stream);
    // What finds the child again. Linear in an indexed group.
    virtual KFS_StreamID SlowGetIDOfChild(KFS_StreamBase const* child) const = 0;
    // Takes a child on its way out from the group, without deleting it; false if it isn't here.
    virtual bool RemoveChild(KFS_StreamBase* child) = 0;
    virtual bool CouldGoMissing() const;
    // Time units a second of the leaves below: the parent's answer, or 600 without a parent.
    virtual unsigned int GetPreferredTimeScale() const;
    // Runs a leaf's expression at the root. 1 means that there is no value, which is the answer here; the host's root
    // overrides it.
    [[nodiscard]] virtual int EvaluateExpression(KFS_Stream const* stream, T_Time const* time, double* values,
                                                 void** customValue, KFS_ParamBag const* bag);

    // The display position of a kind of child.
    unsigned int GetIndexInUILayout(KFS_MatchName const& name) const;
    // The same for who asks again: no search where the guess is right.
    unsigned int GetIndexInUILayout(KFS_MatchName const& name, unsigned int guess) const;
    // The layout of the group type of that name; empty if the factory knows no such group.
    boost::shared_ptr<KFS_CanonicalLayout> GetCanonicalLayout(KFS_MatchName const& name) const;

    // The stream at the end of a path from here; this group itself for the empty path. The editable form upgrades every
    // canonical stream on its way, and what it has upgraded stays so where the path then fails. A path through a leaf is
    // a broken invariant, "expected group".
    KFS_StreamBase const* FindStream(KFS_StreamIDPath const& path) const;
    KFS_StreamBase* FindEditableStream(KFS_StreamIDPath const& path);
    // A real leaf at the end of a path, else null. Never upgrades.
    KFS_Stream* FindEditableLeafStreamNullOK(KFS_StreamIDPath const& path);
    KFS_Stream const* FindEditableLeafStreamNullOK(KFS_StreamIDPath const& path) const;

    // Whether the leaf at the end of a path has separated dimensions; false if there is no leaf.
    bool AreLeafDimensionsSeparated(KFS_StreamIDPath const& path) const;
    // The path of a separation leader's follower: the leader's with the layout entry that stands `dimension` + 1 behind it.
    // Empty where `path` leads to no leaf with a parent.
    KFS_StreamIDPath GetLeafSeparationPath(KFS_StreamIDPath const& path, int dimension) const;

    // Calls NotifyStreamStored on this group and on each of its ancestors, once: a call from inside such a notification
    // does nothing.
    void NotifyParentsStreamStored(KFS_StreamBase* stream);

    // Hands each real leaf below this group to `f`, in child order, depth first. `path` may be null; else it is
    // extended to the leaf during the call and is what it was afterwards.
    template <class F>
    void ForEachNonCanonicalLeafStream(F& f, KFS_StreamIDPath* path);

protected:
    // `name` and `factory` may be null. Takes over the layout of the canonical group of that name.
    KFS_StreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical);
    // Shares the layout.
    KFS_StreamGroup(KFS_StreamGroup const& source);

    boost::shared_ptr<KFS_CanonicalLayout> const& GetLayout() const { return canonicalLayout_; }
    void SetLayout(boost::shared_ptr<KFS_CanonicalLayout> layout);
    // Makes this the parent of the real ones of cloned children, without what SetParent does besides.
    void pAdopt(KFS_GroupChildren const& children)
    {
        for (KFS_StreamBase* const child : children)
            if (!child->IsCanonical()) child->parent_ = this;
    }

private:
    friend class KFS_NamedStreamGroup;  // whose slots are in that order

    // Takes over what the group type of that name has.
    void ShareLayoutOf(KFS_MatchName const& name);
    KFS_StreamGroup const* FindCanonicalGroup(KFS_MatchName const& name) const;
    // The display position of a kind of child, or none.
    std::optional<unsigned int> FindPosition(KFS_MatchName const& name) const;

    // One vector for all instances of a group type, which nobody changes once it is here; null without a layout.
    boost::shared_ptr<KFS_CanonicalLayout> canonicalLayout_;
    boost::shared_ptr<KFSp_LayoutOrder const> layoutOrder_;  // of canonicalLayout_
};

template <class F>
void KFS_StreamGroup::ForEachNonCanonicalLeafStream(F& f, KFS_StreamIDPath* path)
{
    for (unsigned int i = 0; i < GetNumStreams(); ++i) {
        KFS_StreamBase* const child = GetEditableStreamNullOK(i);
        if (!child) continue;
        if (path) path->AddTail(KFS_StreamID(i, child->GetMatchName()));
        if (KFS_Stream* const leaf = child->GetAsLeaf())
            f(leaf);
        else if (KFS_StreamGroup* const group = child->GetAsGroup())
            group->ForEachNonCanonicalLeafStream(f, path);
        if (path) path->RemoveTail();
    }
}
