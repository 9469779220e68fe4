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

// What a bag's GUID begins with, and that of an empty one is made of.
KFS_OverrideHash EmptyHash()
{
    KFS_OverrideHash hash;
    hash.Mix("KFS_ParamBag", 12);
    return hash;
}

}  // namespace

KFS_ParamBag::KFS_ParamBag(KFS_ParamBag const& source)
{
    if (source.IsEmpty()) return;
    content_ = std::make_unique<Content>();
    content_->overrides = source.content_->overrides;
    FillIndex();
    boost::mutex::scoped_lock const hold(source.content_->lock);
    content_->guid = source.content_->guid;
    content_->dirty = source.content_->dirty.load();
}

KFS_ParamBag::KFS_ParamBag(KFS_ParamBag const& a, KFS_ParamBag const& b) : KFS_ParamBag(a)
{
    if (b.IsEmpty()) return;
    if (!content_) content_ = std::make_unique<Content>();
    content_->overrides.insert(b.content_->overrides.begin(), b.content_->overrides.end());
    FillIndex();
    content_->dirty = true;
}

void KFS_ParamBag::FillIndex()
{
    std::vector<Named>& index = content_->index;
    index.clear();
    index.reserve(content_->overrides.size());
    for (Overrides::value_type const& entry : content_->overrides)
        index.push_back({KFSp_CapsuleHash(entry.first), &entry});
    std::ranges::sort(index, {}, &Named::hash);
}

// What can run out of memory comes first: a GUID must never stand beside a content that isn't its own.
KFS_ParamBag& KFS_ParamBag::operator=(KFS_ParamBag const& source)
{
    if (this != &source) *this = KFS_ParamBag(source);
    return *this;
}

KFS_ParamBag& KFS_ParamBag::operator=(KFS_ParamBag&& source) noexcept
{
    content_.swap(source.content_);
    return *this;
}

KFS_ParamBag::~KFS_ParamBag() = default;

void KFS_ParamBag::SetDirty() const
{
    if (!content_) return;
    boost::mutex::scoped_lock const hold(content_->lock);
    content_->dirty = true;
    content_->guid = Guid();
}

// All bags without a content are the same bag; what is worked out for them is kept nowhere.
Guid KFS_ParamBag::GetGUID() const
{
    if (!content_) return EmptyHash().GetGuid();
    if (content_->dirty) ComputeGuid();
    return content_->guid;
}

// Of several threads that come here at once one computes; the others find it done, and nobody writes what another reads.
void KFS_ParamBag::ComputeGuid() const
{
    boost::mutex::scoped_lock const hold(content_->lock);
    if (!content_->dirty) return;
    KFS_OverrideHash hash = EmptyHash();
    for (auto const& [id, streamOverride] : content_->overrides) {
        hash.Mix(id.data(), id.size() * sizeof(unsigned short));
        streamOverride->MixIn(hash);
    }
    content_->guid = hash.GetGuid();
    content_->dirty = false;
}

void KFS_ParamBag::AddOverride(KFS_StreamBase const* stream, boost::shared_ptr<KFS_StreamOverride> streamOverride)
{
    u16str const& id = stream->GetStreamCapsuleData().id;
    if (!content_) content_ = std::make_unique<Content>();
    std::vector<Named>& index = content_->index;
    index.reserve(content_->overrides.size() + 1);  // so that nothing fails once the entry is made
    auto const [place, isNew] = content_->overrides.try_emplace(id);
    place->second = std::move(streamOverride);
    unsigned int const hash = KFSp_CapsuleHash(id);
    if (isNew) index.insert(std::ranges::upper_bound(index, hash, {}, &Named::hash), {hash, &*place});
    SetDirty();
}

void KFS_ParamBag::Clear()
{
    content_.reset();
}

KFS_StreamOverride const* KFS_ParamBag::Find(KFS_StreamBase const* stream) const
{
    if (!content_) return nullptr;
    std::vector<Named> const& index = content_->index;
    if (index.empty()) return nullptr;
    unsigned int const hash = stream->GetStreamCapsuleHash();
    auto named = std::ranges::lower_bound(index, hash, {}, &Named::hash);
    if (named == index.end() || named->hash != hash) return nullptr;
    u16str const& id = stream->GetStreamCapsuleData().id;
    for (; named != index.end() && named->hash == hash; ++named)
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
    return !content_ || std::ranges::all_of(
                            content_->overrides, [](auto const& entry) { return entry.second->IsTimeInvariant(); });
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
    if (!content_ || !other.content_) return different;
    Overrides const& mine = content_->overrides;
    for (auto const& [id, theirs] : other.content_->overrides) {
        auto const place = mine.find(id);
        if (place == mine.end() || *place->second == *theirs) continue;
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
