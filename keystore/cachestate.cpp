#include "keystore/cachestate.h"

#include <boost/make_shared.hpp>

hearth::utility::ImmutableString const& KFS_StreamCacheState::GetStateName() const
{
    return S_StateName;
}

KFS_StreamCacheState::~KFS_StreamCacheState() = default;

void KFS_StreamCacheState::Activate() {}

void KFS_StreamCacheState::Deactivate() {}

KFS_StreamKeyData* KFS_StreamCacheState::GetOverrideKeyData(KFS_Stream const* stream, KFS_StreamKeyData const& source)
{
    if (stream == lastStream_) return lastKeyData_;
    boost::shared_ptr<KFS_StreamKeyData>& entry = keyData_[stream];
    if (!entry) entry = boost::make_shared<KFS_StreamKeyData>(source, stream);
    lastStream_ = stream;
    lastKeyData_ = entry.get();
    return lastKeyData_;
}

void KFS_StreamCacheState::FreeCacheData()
{
    lastStream_ = nullptr;
    lastKeyData_ = nullptr;
    keyData_.clear();
}
