#include "tree/indexedgroup.h"

#include "frame/boundary_private.h"
#include "tree/groupsupport_private.h"

#include <algorithm>

namespace {

constexpr char const* CorruptGroupText =
    "$$$/VX/KFS/InsertStream/InvalidSubTypeError=There was an error reading the ^1 parameter "
    "group. The project file is corrupt. Skipping the layer.";

// Tells the user that a group of a project holds what it can't hold.
[[noreturn]] void RefuseCorruptChild(KFS_StreamGroup const& group)
{
    u16str message = Q_ZStringToUTF16String(CorruptGroupText);
    Q_SubString(&message, message, group.GetDisplayName());
    Q_ReportError(0, Q_SeverityError, message);
    throw int{3};
}

// Silences this thread's notifications for a scope.
class PausedListeners {
public:
    PausedListeners() { KFSp_ThrowIf(KFS_PauseMainListener(true, wasPaused_)); }
    ~PausedListeners()
    {
        bool ignored = false;
        static_cast<void>(KFS_PauseMainListener(wasPaused_, ignored));  // what could be paused can go on
    }
    PausedListeners(PausedListeners const&) = delete;
    PausedListeners& operator=(PausedListeners const&) = delete;

private:
    bool wasPaused_ = false;
};

}  // namespace

KFS_IndexedStreamGroup::KFS_IndexedStreamGroup(KFS_MatchName const* name, KFS_StreamFactory* factory, bool canonical)
    : KFS_StreamGroup(name, factory, canonical)
{}

KFS_IndexedStreamGroup::KFS_IndexedStreamGroup(KFS_IndexedStreamGroup const& source,
                                               KFS_CloneStreamParams const& params)
    : KFS_StreamGroup(source),
      streams_(KFSp_CloneChildren(source.streams_, params))
{
    pAdopt(streams_);
}

KFS_IndexedStreamGroup::~KFS_IndexedStreamGroup()
{
    for (unsigned int i = static_cast<unsigned int>(streams_.size()); i-- > 0;) {
        if (i >= streams_.size()) continue;  // a listener has taken some more
        KFS_StreamBase* const child = streams_[i];
        if (!child->IsCanonical())
            delete KFS_IndexedStreamGroup::RemoveStream(i);
        else if (child->GetParent() == this)
            child->SetParent(nullptr);
    }
    KFSp_DeleteChildren(&streams_);  // what a listener has put in meanwhile
}

bool KFS_IndexedStreamGroup::IsModified() const
{
    return !streams_.empty();
}

bool KFS_IndexedStreamGroup::IsIndexedGroup() const
{
    return true;
}

KFS_IndexedStreamGroup const* KFS_IndexedStreamGroup::GetAsIndexedGroup() const
{
    return this;
}

KFS_IndexedStreamGroup* KFS_IndexedStreamGroup::GetAsIndexedGroup()
{
    return this;
}

unsigned int KFS_IndexedStreamGroup::GetNumStreams() const
{
    return static_cast<unsigned int>(streams_.size());
}

KFS_StreamBase* KFS_IndexedStreamGroup::GetEditableStream(unsigned int index)
{
    return At(index);
}

KFS_StreamBase const* KFS_IndexedStreamGroup::GetStream(unsigned int index) const
{
    return At(index);
}

KFS_StreamBase* KFS_IndexedStreamGroup::GetEditableStreamNullOK(unsigned int index)
{
    return At(index);
}

KFS_StreamBase const* KFS_IndexedStreamGroup::GetEditableStreamNullOK(unsigned int index) const
{
    return At(index);
}

KFS_StreamBase const* KFS_IndexedStreamGroup::GetStream(KFS_StreamID const& id) const
{
    return At(id);
}

KFS_StreamBase* KFS_IndexedStreamGroup::GetEditableStream(KFS_StreamID const& id)
{
    return At(id);
}

KFS_StreamID KFS_IndexedStreamGroup::SlowGetIDOfChild(KFS_StreamBase const* child) const
{
    auto const found = std::find(streams_.begin(), streams_.end(), child);
    if (found == streams_.end()) KFSp_FailVerification("child not found in parent");
    return KFS_StreamID(static_cast<unsigned int>(found - streams_.begin()), child->GetMatchName());
}

bool KFS_IndexedStreamGroup::RemoveChild(KFS_StreamBase* child)
{
    return KFSp_RemoveChild(this, &streams_, child);
}

KFS_Stream const* KFS_IndexedStreamGroup::GetLeafStream(unsigned int index) const
{
    return GetStream(index)->GetAsLeaf();
}

KFS_Stream* KFS_IndexedStreamGroup::GetEditableLeafStream(unsigned int index)
{
    return GetEditableStream(index)->GetAsLeaf();
}

void KFS_IndexedStreamGroup::InsertStream(unsigned int index, Q_ScAutoPtr<KFS_StreamBase>* stream)
{
    KFS_StreamBase* const incoming = stream->get();
    if (!CanStore(incoming->GetMatchName())) RefuseCorruptChild(*this);
    if (index > GetNumStreams()) KFSp_FailVerification("invalid index for insert in indexed group");
    KFS_StreamBase const* const next = index < GetNumStreams() ? streams_[index] : nullptr;
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamAboutToBeInserted, this, incoming, index);
    streams_.insert(streams_.begin() + PlaceBefore(next, index), incoming);
    static_cast<void>(stream->release());
    incoming->SetParent(this);
    unsigned int const place = KFSp_PlaceOf(streams_, incoming);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamInserted, this, incoming, place);
}

// Where a stream that was to stand in front of `next`, or at the end, belongs now.
unsigned int KFS_IndexedStreamGroup::PlaceBefore(KFS_StreamBase const* next, unsigned int index)
{
    auto const size = static_cast<unsigned int>(streams_.size());
    unsigned int const place = next ? KFSp_PlaceOf(streams_, next) : size;
    return next && place == size ? std::min(index, size) : place;
}

KFS_StreamBase* KFS_IndexedStreamGroup::DuplicateStream(unsigned int index)
{
    Q_ScAutoPtr<KFS_StreamBase> copy(GetStream(index)->CloneStream(KFS_CloneStreamParams{true, true}));
    KFS_StreamBase* const stream = copy.get();
    stream->SetCanonical(false);  // the factory knows nothing of this one, so it must be the group's
    InsertStream(index + 1, &copy);
    return KFSp_PlaceOf(streams_, stream) < streams_.size() ? stream : nullptr;
}

KFS_StreamBase* KFS_IndexedStreamGroup::SwapStream(unsigned int index, Q_ScAutoPtr<KFS_StreamBase>* stream)
{
    if (index >= GetNumStreams()) KFSp_FailVerification("invalid index for swap in indexed group");
    KFS_StreamBase* const incoming = stream->get();
    if (!CanStore(incoming->GetMatchName())) KFSp_FailVerification("invalid name for storing in this named group");
    KFS_StreamBase* const outgoing = streams_[index];
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamAboutToBeSwapped, this, incoming, index);
    if (!incoming->IsCanonical()) incoming->SetParent(this);
    unsigned int const place = KFSp_PlaceOf(streams_, outgoing);
    if (place == streams_.size()) {
        incoming->SetParent(nullptr);
        KFSp_FailVerification("invalid index for swap in indexed group");
    }
    streams_[place] = stream->release();
    // A failure further on must not lose the stream that left.
    Q_ScAutoPtr<KFS_StreamBase> leaving(outgoing->IsCanonical() ? nullptr : outgoing);
    outgoing->SetParent(nullptr);
    KFSp_NotifyOfSwap(this, streams_, incoming, incoming, place);
    static_cast<void>(leaving.release());
    return outgoing;
}

KFS_StreamBase* KFS_IndexedStreamGroup::RemoveStream(unsigned int index)
{
    if (index >= GetNumStreams()) KFSp_FailVerification("invalid index for remove in indexed group");
    KFS_StreamBase* const child = At(index);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamAboutToBeRemoved, this, child, index);
    unsigned int const place = KFSp_PlaceOf(streams_, child);
    if (place == streams_.size()) return nullptr;
    streams_.erase(streams_.begin() + place);
    Q_ScAutoPtr<KFS_StreamBase> leaving(child->IsCanonical() ? nullptr : child);
    child->SetParent(nullptr);
    KFSp_NotifyOfChild(&KFS_StreamListener::StreamRemoved, this, child, place);
    static_cast<void>(leaving.release());
    return child;
}

void KFS_IndexedStreamGroup::ReorderStreamsStart(KFS_StreamBase* stream, unsigned int from, unsigned int to)
{
    KFSp_Notify(
        this, [=, this](KFS_StreamListener* listener) { listener->StreamsAboutToBeReordered(this, stream, from, to); });
}

void KFS_IndexedStreamGroup::ReorderStreamsEnd(KFS_StreamBase* stream, unsigned int from, unsigned int to)
{
    KFSp_Notify(
        this, [=, this](KFS_StreamListener* listener) { listener->StreamsReordered(this, stream, from, to); });
}

void KFS_IndexedStreamGroup::ReorderStreams(unsigned int from, unsigned int to)
{
    KFS_StreamBase* const stream = GetEditableStream(from);
    bool const isPlace = to < GetNumStreams();
    ReorderStreamsStart(stream, from, to);
    {
        PausedListeners const paused;
        KFSp_ScIncoming moving(RemoveStream(KFSp_PlaceOf(streams_, stream)));
        if (isPlace) to = std::min(to, GetNumStreams());  // a listener may have made the list shorter
        InsertStream(to, &moving.stream);
    }
    ReorderStreamsEnd(stream, from, to);
}

unsigned int KFS_IndexedStreamGroup::AppendStream(Q_ScAutoPtr<KFS_StreamBase>* stream)
{
    KFS_StreamBase const* const incoming = stream->get();
    InsertStream(GetNumStreams(), stream);
    return KFSp_PlaceOf(streams_, incoming);
}

KFS_StreamBase* KFS_IndexedStreamGroup::At(unsigned int index) const
{
    if (index >= streams_.size()) KFSp_FailVerification("invalid index in indexed group");
    return streams_[index];
}

KFS_StreamBase* KFS_IndexedStreamGroup::At(KFS_StreamID const& id) const
{
    if (id.GetIndex() == KFS_StreamID::NoIndex)
        KFSp_FailVerification("index must be specified for lookup in indexed group");
    KFS_StreamBase* const child = At(id.GetIndex());
    KFSp_ValidateMatchNames(id, child);
    return child;
}
