#pragma once

#include "frame/errors.h"
#include "keystore/stream.h"

#include <array>
#include <cstddef>

// Records put aside while an edit may still fail. All of them copy bytes: what a record owns stays where it is.

// Zeroed room for a scope, on the stack where it is small.
class KFSp_ScBytes {
public:
    explicit KFSp_ScBytes(std::size_t size) noexcept;
    ~KFSp_ScBytes();
    KFSp_ScBytes(KFSp_ScBytes const&) = delete;
    KFSp_ScBytes& operator=(KFSp_ScBytes const&) = delete;

    // Null when out of memory.
    void* get() const noexcept { return bytes_; }

private:
    alignas(16) std::array<std::byte, 256> small_;
    void* big_ = nullptr;
    void* bytes_;
};

// The cache record as it is now. Not for a custom stream that passes for a plain one: its record's size isn't to be had
// then.
class KFSp_SavedCache {
public:
    explicit KFSp_SavedCache(KFS_Stream const* stream) noexcept;

    // 0, or 4: nothing was saved.
    [[nodiscard]] int Code() const noexcept { return bytes_.get() ? 0 : KFS_Err_OutOfMemory; }
    KFS_KeyScalar* get() const noexcept { return static_cast<KFS_KeyScalar*>(bytes_.get()); }
    void Restore() const noexcept;

private:
    KFS_KeyScalar* cache_;
    std::size_t size_;
    KFSp_ScBytes bytes_;
};

// The keys `first` to `last` of the list as they are now. Restore() puts them back under the same indices, but for
// their arc tables and times, which belong to the update pass.
class KFSp_SavedKeys {
public:
    KFSp_SavedKeys(KFS_Stream const* stream, KFS_StreamKeyData const* data, int first, int last) noexcept;

    // 0, 4 or the list service's: nothing was saved.
    [[nodiscard]] int Code() const noexcept { return code_; }
    void Restore() const noexcept;

private:
    KFS_StreamKeyData const* data_;
    std::size_t size_;
    int first_;
    int last_;
    KFSp_ScBytes bytes_;
    int code_;
};

// The nearest keys on both sides that aren't float keys, looking from `before` down and from `after` up: whatever a
// split of the segment between them may change lies in [first, last]. Clipped to the list.
struct KFSp_AnchorRange {
    int first;
    int last;

    KFSp_AnchorRange(KFS_StreamKeyData const* data, int before, int after) noexcept;
};
