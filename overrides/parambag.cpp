#include "overrides/parambag.h"

#include "tree/capsulehash_private.h"
#include "tree/streambase.h"

#include <algorithm>
#include <cstring>
#include <utility>

using hearth::utility::Guid;

namespace {

bool Same(u16str const& a, u16str const& b)
{
    return a.size() == b.size() && std::memcmp(a.data(), b.data(), a.size() * sizeof(unsigned short)) == 0;
}

}  // namespace

KFS_ParamBag::KFS_ParamBag(KFS_ParamBag const& source) : overrides_(source.overrides_)
{
    FillIndex();
    boost::mutex::scoped_lock const hold(source.lock_);
    guid_ = source.guid_;
    dirty_ = source.dirty_.load();
}

KFS_ParamBag::KFS_ParamBag(KFS_ParamBag const& a, KFS_ParamBag const& b) : overrides_(a.overrides_)
{
    overrides_.insert(b.overrides_.begin(), b.overrides_.end());
    FillIndex();
}

void KFS_ParamBag::FillIndex()
{
    index_.reserve(overrides_.size());
    for (Overrides::value_type const& entry : overrides_) index_.push_back({KFSp_CapsuleHash(entry.first), &entry});
    std::ranges::sort(index_, {}, &Named::hash);
}

// What can run out of memory comes first: a GUID must never stand beside a content that isn't its own.
KFS_ParamBag& KFS_ParamBag::operator=(KFS_ParamBag const& source)
{
    if (this != &source) *this = KFS_ParamBag(source);
    return *this;
}

KFS_ParamBag& KFS_ParamBag::operator=(KFS_ParamBag&& source) noexcept
{
    overrides_.swap(source.overrides_);
    index_.swap(source.index_);
    std::swap(guid_, source.guid_);
    dirty_ = source.dirty_.exchange(dirty_);
    return *this;
}

KFS_ParamBag::~KFS_ParamBag() = default;

void KFS_ParamBag::SetDirty() const
{
    boost::mutex::scoped_lock const hold(lock_);
    dirty_ = true;
    guid_ = Guid();
}

Guid KFS_ParamBag::GetGUID() const
{
    if (dirty_) ComputeGuid();
    return guid_;
}

// Of several threads that come here at once one computes; the others find it done, and nobody writes what another reads.
void KFS_ParamBag::ComputeGuid() const
{
    boost::mutex::scoped_lock const hold(lock_);
    if (!dirty_) return;
    KFS_OverrideHash hash;
    hash.Mix("KFS_ParamBag", 12);
    for (auto const& [id, streamOverride] : overrides_) {
        hash.Mix(id.data(), id.size() * sizeof(unsigned short));
        streamOverride->MixIn(hash);
    }
    guid_ = hash.GetGuid();
    dirty_ = false;
}

void KFS_ParamBag::AddOverride(KFS_StreamBase const* stream, boost::shared_ptr<KFS_StreamOverride> streamOverride)
{
    u16str const& id = stream->GetStreamCapsuleData().id;
    index_.reserve(overrides_.size() + 1);  // so that nothing fails once the entry is made
    auto const [place, isNew] = overrides_.try_emplace(id);
    place->second = std::move(streamOverride);
    unsigned int const hash = KFSp_CapsuleHash(id);
    if (isNew) index_.insert(std::ranges::upper_bound(index_, hash, {}, &Named::hash), {hash, &*place});
    SetDirty();
}

void KFS_ParamBag::Clear()
{
    overrides_.clear();
    index_.clear();
    SetDirty();
}

KFS_StreamOverride const* KFS_ParamBag::Find(KFS_StreamBase const* stream) const
{
    if (index_.empty()) return nullptr;
    unsigned int const hash = stream->GetStreamCapsuleHash();
    auto named = std::ranges::lower_bound(index_, hash, {}, &Named::hash);
    if (named == index_.end() || named->hash != hash) return nullptr;
    u16str const& id = stream->GetStreamCapsuleData().id;
    for (; named != index_.end() && named->hash == hash; ++named)
        if (Same(named->entry->first, id)) return named->entry->second.get();
    return nullptr;
}

bool KFS_ParamBag::StreamOverridden(KFS_StreamBase const* stream, T_Time const& time, KFS_OverrideValue* value) const
{
    KFS_StreamOverride const* const found = Find(stream);
    if (!found) return false;
    *value = found->GetValAtTime(time);
    return true;
}

bool KFS_ParamBag::GetStreamOverride(KFS_StreamBase const* stream, KFS_StreamOverride const** streamOverride) const
{
    KFS_StreamOverride const* const found = Find(stream);
    if (!found) return false;
    *streamOverride = found;
    return true;
}

bool KFS_ParamBag::IsTimeInvariant() const
{
    return std::all_of(
        overrides_.begin(), overrides_.end(), [](auto const& entry) { return entry.second->IsTimeInvariant(); });
}

int KFS_ParamBag::GetSortOrder(KFS_ParamBag const& other) const
{
    Guid const mine = GetGUID();
    Guid const others = other.GetGUID();
    if (mine == others) return 0;
    return mine < others ? -1 : 1;
}

std::vector<boost::shared_ptr<KFS_StreamOverride>>
KFS_ParamBag::FindRightySymmetricDifference(KFS_ParamBag const& other, bool effectsOnly) const
{
    std::vector<boost::shared_ptr<KFS_StreamOverride>> different;
    for (auto const& [id, theirs] : other.overrides_) {
        auto const place = overrides_.find(id);
        if (place == overrides_.end() || *place->second == *theirs) continue;
        if (!effectsOnly || theirs->GetIsForEffectStream()) different.push_back(theirs);
    }
    return different;
}

KFS_MergedParamBagHelper::KFS_MergedParamBagHelper(KFS_ParamBag const* a, KFS_ParamBag const* b)
{
    bool const hasA = a && !a->IsEmpty();
    bool const hasB = b && !b->IsEmpty();
    if (hasA && hasB) {
        merged_ = std::make_shared<KFS_ParamBag>(*a, *b);
        bag_ = merged_.get();
    } else if (hasA || (a && !hasB)) {
        bag_ = a;
    } else {
        bag_ = b;
    }
}
