#include "tree/matchname.h"

#include "frame/boundary_private.h"
#include "frame/services/strings.h"
#include "tree/matchnamepool_private.h"

#include <boost/thread/locks.hpp>

#include <cstdint>
#include <cstring>

namespace {

unsigned char const* AsBytes(char const* text)
{
    return reinterpret_cast<unsigned char const*>(text);
}

hearth::utility::Guid HashText(unsigned char const* text)
{
    hearth::utility::Murmur3MixerState state;
    if (text) hearth::utility::UpdateHashState(state, text, std::strlen(reinterpret_cast<char const*>(text)));
    hearth::utility::Guid guid;
    hearth::utility::GetHashResult(state, guid);
    return guid;
}

}  // namespace

KFSp_MatchNameEntry::KFSp_MatchNameEntry(unsigned char const* text) : name_(text), guid_(HashText(text)) {}

KFSp_MatchNameEntry::KFSp_MatchNameEntry(KFSp_MatchNameEntry const& other) : guid_(other.guid_)
{
    KFSp_ThrowIf(Q_CopyString(reinterpret_cast<char const*>(other.GetName()), static_cast<int>(BufferSize),
                              reinterpret_cast<char*>(nameBuffer_)));
}

// The bytes folded one by one with boost::hash_combine's recipe, from a seed of 0.
std::size_t KFSp_HashGuid::operator()(KFSp_MatchNameEntry const& entry) const
{
    unsigned char bytes[16];
    hearth::utility::Guid::GuidToBytes(entry.GetGuid(), bytes);
    std::uint64_t seed = 0;
    for (unsigned char const byte : bytes) seed ^= byte + std::uint64_t{0x9e3779b9} + (seed << 6) + (seed >> 2);
    return static_cast<std::size_t>(seed);
}

KFSp_MatchNamePool::KFSp_MatchNamePool() : entries_(16)
{
    entries_.max_load_factor(1.0F);
}

KFSp_MatchNameEntry const* KFSp_MatchNamePool::FindRecent(hearth::utility::Guid const& guid) const
{
    KFSp_MatchNameEntry const* const entry = RecentOf(guid).load(std::memory_order_acquire);
    return entry && entry->GetGuid() == guid ? entry : nullptr;
}

hearth::utility::Guid KFSp_MatchNamePool::GuidFromName(unsigned char const* text)
{
    KFSp_MatchNameEntry const key(text);
    if (FindRecent(key.GetGuid())) return key.GetGuid();
    boost::upgrade_lock<boost::shared_mutex> shared(mutex_);
    auto found = entries_.find(key);
    if (found == entries_.end()) {
        boost::upgrade_to_unique_lock<boost::shared_mutex> const exclusive(shared);
        found = entries_.find(key);
        if (found == entries_.end()) found = entries_.insert(key);
    }
    RecentOf(key.GetGuid()).store(&*found, std::memory_order_release);
    return found->GetGuid();
}

unsigned char const* KFSp_MatchNamePool::NameFromGuid(hearth::utility::Guid const& guid) const
{
    if (KFSp_MatchNameEntry const* const recent = FindRecent(guid)) return recent->GetName();
    boost::shared_lock<boost::shared_mutex> const shared(mutex_);
    auto const found = entries_.find(KFSp_MatchNameEntry(guid));
    if (found == entries_.end()) return nullptr;
    RecentOf(guid).store(&*found, std::memory_order_release);
    return found->GetName();
}

KFS_MatchName::KFS_MatchName(unsigned char const* text, bool)
{
    SetName(text);
}

KFS_MatchName::KFS_MatchName(char const* text, bool)
{
    SetName(text);
}

KFS_MatchName::KFS_MatchName(std::basic_string<unsigned char> const& text, bool)
{
    SetName(text);
}

KFS_MatchName& KFS_MatchName::operator=(unsigned char const* text)
{
    SetName(std::basic_string<unsigned char>(text));
    return *this;
}

KFS_MatchName& KFS_MatchName::operator=(char const* text)
{
    SetName(std::basic_string<unsigned char>(AsBytes(text)));
    return *this;
}

void KFS_MatchName::SetName(unsigned char const* text)
{
    guid_ = KFSp_GetMatchNamePool().GuidFromName(text);
}

void KFS_MatchName::SetName(char const* text)
{
    SetName(AsBytes(text));
}

void KFS_MatchName::SetName(std::basic_string<unsigned char> const& text)
{
    SetName(text.c_str());
}

unsigned char const* KFS_MatchName::GetName() const
{
    return KFSp_GetMatchNamePool().NameFromGuid(guid_);
}
