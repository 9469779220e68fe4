// The private copies of a render: which stream has one, and the stand-ins that own them.

#include "keystore/cachestate.h"

#include <boost/make_shared.hpp>

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

KFS_StreamKeyData* KFS_StreamCacheState::GetOverrideKeyData(KFS_Stream const* stream, KFS_StreamKeyData const& source)
{
    if (stream == lastStream_) return lastKeyData_;
    boost::shared_ptr<KFS_StreamKeyData>& entry = keyData_[stream];
    if (!entry) {
        boost::shared_ptr<KFSp_StandIn> const standIn = boost::make_shared<KFSp_StandIn>(*stream, source);
        entry = boost::shared_ptr<KFS_StreamKeyData>(standIn, &standIn->stream.keyData_);
    }
    lastStream_ = stream;
    lastKeyData_ = entry.get();
    return lastKeyData_;
}

KFS_StreamKeyData* KFS_StreamCacheState::Find(KFS_Stream const* stream) const
{
    auto const place = keyData_.find(stream);
    return place == keyData_.end() ? nullptr : place->second.get();
}

// Copies are taken out of the map before they end: a client's dispose function runs then, and may read.
void KFS_StreamCacheState::Forget(KFS_Stream const* stream)
{
    if (stream == lastStream_) lastStream_ = nullptr;
    auto const ending = keyData_.extract(stream);
}

void KFS_StreamCacheState::ForgetExpressionCache(KFS_ExprInfo const* info)
{
    auto const ending = expressionCaches_.extract(info);
}

void KFS_StreamCacheState::FreeCacheData()
{
    lastStream_ = nullptr;
    lastKeyData_ = nullptr;
    decltype(keyData_) endingData;
    endingData.swap(keyData_);
    decltype(expressionCaches_) endingCaches;
    endingCaches.swap(expressionCaches_);
}
