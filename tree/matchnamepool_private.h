#pragma once

#include "frame/services/identifiers.h"

#include <boost/thread/shared_mutex.hpp>
#include <boost/unordered_set.hpp>

#include <array>
#include <atomic>
#include <cstddef>
#include <functional>

// One text and its hash. Equality is by hash alone, so an entry made from a hash is a key for the way back to the text.
class KFSp_MatchNameEntry {
public:
    static constexpr std::size_t BufferSize = 40;

    KFSp_MatchNameEntry() = default;
    explicit KFSp_MatchNameEntry(hearth::utility::Guid const& guid) : guid_(guid) {}
    // Borrows the text (null counts as empty) and hashes all of it, without its NUL.
    explicit KFSp_MatchNameEntry(unsigned char const* text);
    // A copy owns its text: the borrowed pointer is never kept. Throws what Q_CopyString returns.
    KFSp_MatchNameEntry(KFSp_MatchNameEntry const& other);
    KFSp_MatchNameEntry& operator=(KFSp_MatchNameEntry const&) = delete;

    unsigned char const* GetName() const { return name_ ? name_ : nameBuffer_; }
    hearth::utility::Guid const& GetGuid() const { return guid_; }

    friend bool operator==(KFSp_MatchNameEntry const& a, KFSp_MatchNameEntry const& b) { return a.guid_ == b.guid_; }

private:
    unsigned char const* name_ = nullptr;
    unsigned char nameBuffer_[BufferSize] = {};
    hearth::utility::Guid guid_;
};

struct KFSp_HashGuid {
    std::size_t operator()(KFSp_MatchNameEntry const& entry) const;
};

// Maps texts to hashes and back. Entries are never removed and never move.
class KFSp_MatchNamePool {
public:
    KFSp_MatchNamePool();

    hearth::utility::Guid GuidFromName(unsigned char const* text);
    unsigned char const* NameFromGuid(hearth::utility::Guid const& guid) const;

private:
    using Recent = std::atomic<KFSp_MatchNameEntry const*>;

    Recent& RecentOf(hearth::utility::Guid const& guid) const { return recent_[guid.GuidToBytes()[0]]; }
    KFSp_MatchNameEntry const* FindRecent(hearth::utility::Guid const& guid) const;

    boost::unordered_multiset<KFSp_MatchNameEntry, KFSp_HashGuid, std::equal_to<KFSp_MatchNameEntry>> entries_;
    mutable boost::shared_mutex mutex_;
    // Entries found last, to be seen without the mutex.
    mutable std::array<Recent, 256> recent_{};
};

// The one pool, built when the library loads.
KFSp_MatchNamePool& KFSp_GetMatchNamePool();
