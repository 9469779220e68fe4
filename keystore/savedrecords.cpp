// Copies of records as bytes, for edits that may still fail.

#include "keystore/savedrecords_private.h"

#include "frame/report_private.h"
#include "frame/services/memory.h"
#include "keystore/keylist_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cstring>

namespace {

constexpr char const* ScratchLabel = "key edit scratch";

std::size_t CountOf(int first, int last)
{
    return last >= first ? static_cast<std::size_t>(last - first + 1) : 0;
}

}  // namespace

KFSp_ScBytes::KFSp_ScBytes(std::size_t size) noexcept
{
    if (size > small_.size()) {
        bytes_ = big_ = Q_AllocatePtrClear(KFSp_ModuleId, ScratchLabel, size);
    } else {
        small_.fill(std::byte{});
        bytes_ = small_.data();
    }
}

KFSp_ScBytes::~KFSp_ScBytes()
{
    Q_FreePtr(big_);
}

KFSp_SavedCache::KFSp_SavedCache(KFS_Stream const* stream) noexcept
    : cache_(stream->GetCache()),
      size_(static_cast<std::size_t>(stream->GetCacheSize())),
      bytes_(size_)
{
    if (bytes_.get()) std::memcpy(bytes_.get(), static_cast<void const*>(cache_), size_);
}

void KFSp_SavedCache::Restore() const noexcept
{
    std::memcpy(static_cast<void*>(cache_), bytes_.get(), size_);
}

KFSp_SavedKeys::KFSp_SavedKeys(KFS_Stream const* stream, KFS_StreamKeyData const* data, int first, int last) noexcept
    : data_(data),
      size_(static_cast<std::size_t>(KFSp_KeyItemSize(stream))),
      first_(first),
      last_(last),
      bytes_(CountOf(first, last) * size_),
      code_(bytes_.get() ? 0 : KFS_Err_OutOfMemory)
{
    for (int i = first_; code_ == 0 && i <= last_; ++i) {
        KFS_KeyScalar const* key = nullptr;
        code_ = KFSp_GetConstKey(data_, i, &key);
        if (code_ == 0)
            std::memcpy(static_cast<char*>(bytes_.get()) + static_cast<std::size_t>(i - first_) * size_, key, size_);
    }
}

void KFSp_SavedKeys::Restore() const noexcept
{
    for (int i = first_; i <= last_; ++i) {
        KFS_KeyScalar* key = nullptr;
        if (KFSp_GetKey(data_, i, &key) != 0) return;
        int const time = key->time;
        bool const hasTable = KFSp_HasSpatialBlock(key);
        SEQ_Head** const table = hasTable ? key->remapTable : nullptr;
        std::memcpy(static_cast<void*>(key),
                    static_cast<char const*>(bytes_.get()) + static_cast<std::size_t>(i - first_) * size_, size_);
        key->time = time;
        if (hasTable) key->remapTable = table;
    }
}

KFSp_AnchorRange::KFSp_AnchorRange(KFS_StreamKeyData const* data, int before, int after) noexcept
    : first(std::max(before, 0)),
      last(std::min(after, KFSp_ItemCount(data) - 1))
{
    while (first > 0 && KFSp_FloatsAt(data, first)) --first;
    while (last < KFSp_ItemCount(data) - 1 && KFSp_FloatsAt(data, last)) ++last;
}
