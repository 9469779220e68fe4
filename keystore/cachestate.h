#pragma once

#include "frame/export.h"
#include "frame/services/context.h"
#include "keystore/stream.h"

#include <boost/any.hpp>
#include <boost/shared_ptr.hpp>

#include <cstddef>
#include <map>
#include <vector>

// The private copies of a render on a temporary clone context: for each stream that it reads, the stream as it stood at
// the first read. The host puts one into each such context, and makes the first reads (or all of them) while nobody
// edits the streams.
// A temporary clone context without this state can't be read in. Copies are found by a number that a stream has from the
// first render's question to its end, and its address; a stream's end drops the copy of the context that is current
// then. So a stream that other contexts have read outlives their states, or FreeCacheData is called first.
// Threads: reached by the thread of one context at a time.
class KFS_API KFS_StreamCacheState : public Q_RenderState {
public:
    static hearth::utility::ImmutableString const S_StateName;

    KFS_StreamCacheState() = default;
    hearth::utility::ImmutableString const& GetStateName() const override;
    ~KFS_StreamCacheState() override;
    virtual void Activate();
    virtual void Deactivate();

    // The copy for `stream`, made from `source` at the first call. Throws an int; nothing is kept then.
    KFS_StreamKeyData* GetOverrideKeyData(KFS_Stream const* stream, KFS_StreamKeyData const& source);
    // This render's expression cache for a record, empty at the first call.
    boost::any* GetOverrideExpressionCache(KFS_ExprInfo const* info) { return &expressionCaches_[info]; }
    void ForgetExpressionCache(KFS_ExprInfo const* info);
    // Frees all copies and expression caches.
    void FreeCacheData();

private:
    friend class KFS_Stream;

    friend struct KFSp_KeyDataDoor;

    // The key data belongs to a stand-in for the stream.
    struct Copy {
        KFS_Stream const* stream = nullptr;
        boost::shared_ptr<KFS_StreamKeyData> data;
    };

    // The copy for `stream`, or null.
    KFS_StreamKeyData* Find(KFS_Stream const* stream) const
    {
        std::size_t const slot = stream->renderSlot_.load(std::memory_order_relaxed);
        return slot < copies_.size() && copies_[slot].stream == stream ? copies_[slot].data.get() : nullptr;
    }
    KFS_StreamKeyData* MakeCopy(KFS_Stream const* stream, KFS_StreamKeyData const& source);
    void Forget(KFS_Stream const* stream);
    // A stream has one number for all renders, from the first question of any of them to its end. Takes a lock.
    static std::size_t TakeSlot(KFS_Stream const* stream);
    static void GiveBackSlot(KFS_Stream const* stream);

    std::vector<Copy> copies_;  // by the streams' slots; nobody has number 0
    std::map<KFS_ExprInfo const*, boost::any> expressionCaches_;
};

inline KFS_StreamKeyData* KFS_StreamCacheState::GetOverrideKeyData(KFS_Stream const* stream,
                                                                   KFS_StreamKeyData const& source)
{
    KFS_StreamKeyData* const copy = Find(stream);
    return copy ? copy : MakeCopy(stream, source);
}
