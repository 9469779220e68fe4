// The private copies of a render: which stream has one, and the stand-ins that own them.

#include "keystore/cachestate.h"

#include <boost/make_shared.hpp>

#include <mutex>
#include <utility>

// What a render sees in place of a stream: a leaf without a name and a place, with what the stream was when the copy was
// made. So reads on it need to know nothing of copies, and cost what they cost elsewhere.
struct KFSp_StandIn {
    KFSp_StandIn(KFS_Stream const& original, KFS_StreamKeyData const& source) : stream(original, source) {}
    KFS_Stream stream;
};

hearth::utility::ImmutableString const& KFS_StreamCacheState::GetStateName() const
{
    return S_StateName;
}

KFS_StreamCacheState::~KFS_StreamCacheState()
{
    FreeCacheData();
}

void KFS_StreamCacheState::Activate() {}

void KFS_StreamCacheState::Deactivate() {}

namespace {

// The numbers of streams that renders have asked for. Those given back are given out again, so that a render's table is
// no longer than there were such streams at a time.
struct Slots {
    std::mutex lock;
    std::vector<unsigned int> free;
    unsigned int given = 0;
};

// Never destroyed: streams may end at exit.
Slots& AllSlots()
{
    static Slots* const slots = new Slots;
    return *slots;
}

}  // namespace

std::size_t KFS_StreamCacheState::TakeSlot(KFS_Stream const* stream)
{
    Slots& slots = AllSlots();
    std::lock_guard<std::mutex> const lock(slots.lock);
    unsigned int slot = stream->renderSlot_.load(std::memory_order_relaxed);
    if (slot != 0) return slot;
    if (slots.free.empty()) {
        slots.free.reserve(slots.given + std::size_t{1});  // so that nobody fails to give one back
        slot = ++slots.given;
    } else {
        slot = slots.free.back();
        slots.free.pop_back();
    }
    stream->renderSlot_.store(slot, std::memory_order_relaxed);
    return slot;
}

void KFS_StreamCacheState::GiveBackSlot(KFS_Stream const* stream)
{
    unsigned int const slot = stream->renderSlot_.exchange(0, std::memory_order_relaxed);
    if (slot == 0) return;
    Slots& slots = AllSlots();
    std::lock_guard<std::mutex> const lock(slots.lock);
    slots.free.push_back(slot);
}

// Making the copy may run a client's copy function, which may read in this render: the table grows only afterwards.
KFS_StreamKeyData* KFS_StreamCacheState::MakeCopy(KFS_Stream const* stream, KFS_StreamKeyData const& source)
{
    std::size_t const slot = TakeSlot(stream);
    boost::shared_ptr<KFSp_StandIn> const standIn = boost::make_shared<KFSp_StandIn>(*stream, source);
    Copy copy{stream, boost::shared_ptr<KFS_StreamKeyData>(standIn, &standIn->stream.keyData_)};
    if (slot >= copies_.size()) copies_.resize(slot + 1);
    std::swap(copies_[slot], copy);  // what a stream left here that has ended goes at the end of this scope
    return copies_[slot].data.get();
}

// Copies are taken out of the table before they end: a client's dispose function runs then, and may read.
void KFS_StreamCacheState::Forget(KFS_Stream const* stream)
{
    if (!Find(stream)) return;
    Copy const ending = std::exchange(copies_[stream->renderSlot_.load(std::memory_order_relaxed)], Copy());
}

void KFS_StreamCacheState::ForgetExpressionCache(KFS_ExprInfo const* info)
{
    auto const ending = expressionCaches_.extract(info);
}

void KFS_StreamCacheState::FreeCacheData()
{
    decltype(copies_) endingData;
    endingData.swap(copies_);
    decltype(expressionCaches_) endingCaches;
    endingCaches.swap(expressionCaches_);
}
