#pragma once

#include "frame/services/scoped.h"
#include "tree/streamgroup.h"

// A group whose children form a list, free in number. They are found by position, and CanStore decides which match
// names may stand in it. Every edit is told to the listeners before and after, and they may edit the list meanwhile
// (KFS_StreamListener): its own place is then looked for again. A stream comes to stand in front of the child that it
// was to precede, or, where that is gone, at its index or at the end of a list that is shorter.
//
//   InsertStream(1, x)      a b c  ->  a x b c
//   DuplicateStream(1)      a b c  ->  a b b' c
//   ReorderStreams(0, 2)    a b c  ->  b c a        `to` counts in the list without the stream
class KFS_API KFS_IndexedStreamGroup : public KFS_StreamGroup {
public:
    KFS_IndexedStreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical);
    // Clones the real children, and keeps the canonical ones.
    KFS_IndexedStreamGroup(KFS_IndexedStreamGroup const& source, KFS_CloneStreamParams const& params);
    // Removes and deletes the real children, from the last to the first.
    ~KFS_IndexedStreamGroup() override;

    // With any child at all: the default is an empty list.
    bool IsModified() const override;
    bool IsIndexedGroup() const override;
    KFS_IndexedStreamGroup const* GetAsIndexedGroup() const override;
    KFS_IndexedStreamGroup* GetAsIndexedGroup() override;
    // As KFS_NamedStreamGroup's, with the children in their order.
    hearth::utility::Guid GetRenderGuid(KFS_RenderOptionsBase const& options,
                                        GetRenderGuidFilter* filter) const override;

    unsigned int GetNumStreams() const override;
    // These four give the entry as it is: there is no upgrade here, and a bad index is a broken invariant in all of
    // them.
    KFS_StreamBase* GetEditableStream(unsigned int index) override;
    KFS_StreamBase const* GetStream(unsigned int index) const override;
    KFS_StreamBase* GetEditableStreamNullOK(unsigned int index) override;
    KFS_StreamBase const* GetEditableStreamNullOK(unsigned int index) const override;
    // The identifier must have an index; its match name, if valid, must be the child's.
    KFS_StreamBase const* GetStream(KFS_StreamID const& id) const override;
    KFS_StreamBase* GetEditableStream(KFS_StreamID const& id) override;
    void ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk) override;
    // Position and match name.
    KFS_StreamID SlowGetIDOfChild(KFS_StreamBase const* child) const override;
    // Listeners of both notifications still see the child in the list, unlike with RemoveStream.
    bool RemoveChild(KFS_StreamBase* child) override;

    // Null for a child that isn't a leaf.
    virtual KFS_Stream const* GetLeafStream(unsigned int index) const;
    virtual KFS_Stream* GetEditableLeafStream(unsigned int index);
    // Takes `*stream` over; `index` may be the number of children. A kind of stream that can't stand here means a
    // corrupt project: the user is told. Where it throws before the list has changed, `*stream` keeps its object.
    virtual void InsertStream(unsigned int index, Q_ScAutoPtr<KFS_StreamBase>* stream);
    // Puts a clone right behind its source and returns it, or null if a listener has taken it out again.
    virtual KFS_StreamBase* DuplicateStream(unsigned int index);
    // Returns the stream that left, which is the caller's now. Listeners are told twice of the one that comes, and
    // never which one left. A listener that takes the old one first leaves no place: an invalid index.
    virtual KFS_StreamBase* SwapStream(unsigned int index, Q_ScAutoPtr<KFS_StreamBase>* stream);
    // Returns the stream that left, which is the caller's now; null if a listener has taken it first.
    virtual KFS_StreamBase* RemoveStream(unsigned int index);
    virtual void ReorderStreamsStart(KFS_StreamBase* stream, unsigned int from, unsigned int to);
    virtual void ReorderStreamsEnd(KFS_StreamBase* stream, unsigned int from, unsigned int to);
    // Moves one child. Listeners hear the start and the end only. If `to` is past the end, the stream is lost; a `to`
    // that a listener has put there means the end.
    virtual void ReorderStreams(unsigned int from, unsigned int to);

    // InsertStream at the end; returns the new child's index, or their number if a listener has taken it out again.
    unsigned int AppendStream(Q_ScAutoPtr<KFS_StreamBase>* stream);

private:
    KFS_StreamBase* At(unsigned int index) const;
    KFS_StreamBase* At(KFS_StreamID const& id) const;
    unsigned int PlaceBefore(KFS_StreamBase const* next, unsigned int index);

    KFS_GroupChildren streams_;
};
