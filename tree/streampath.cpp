#include "tree/streampath.h"

#include "tree/verify_private.h"

#include <algorithm>
#include <string_view>

namespace {

// Begins the bytes of a path's identity, so that no other kind of thing has the same.
constexpr std::string_view UIDSeed = "KFS_StreamIDPath::MakeUID";

}  // namespace

KFS_StreamIDPath::KFS_StreamIDPath(KFS_StreamID const& head) : components_{head} {}

KFS_StreamIDPath::KFS_StreamIDPath(KFS_StreamID const& head, KFS_StreamID const& second) : components_{head, second} {}

KFS_StreamIDPath::KFS_StreamIDPath(KFS_StreamID const& head, KFS_StreamID const& second, KFS_StreamID const& third)
    : components_{head, second, third}
{}

KFS_StreamIDPath::KFS_StreamIDPath(KFS_StreamIDPath const& parent, KFS_StreamID const& tail)
{
    components_.reserve(parent.components_.size() + 1);
    components_ = parent.components_;
    components_.push_back(tail);
}

KFS_StreamIDPath::~KFS_StreamIDPath() = default;

void KFS_StreamIDPath::Clear()
{
    std::vector<KFS_StreamID>().swap(components_);
}

KFS_StreamID const& KFS_StreamIDPath::GetComponent(unsigned int position) const
{
    if (position >= GetLength()) KFSp_FailVerification("asked for invalid component of property path");
    return components_[position];
}

KFS_StreamID const& KFS_StreamIDPath::GetHead() const
{
    return GetComponent(0);
}

KFS_StreamID const& KFS_StreamIDPath::GetTail() const
{
    return GetComponent(GetLength() - 1);
}

void KFS_StreamIDPath::AddHead(KFS_StreamID const& id)
{
    components_.insert(components_.begin(), id);
}

void KFS_StreamIDPath::AddTail(KFS_StreamID const& id)
{
    components_.push_back(id);
}

void KFS_StreamIDPath::AddTail(KFS_StreamIDPath const& path)
{
    // By position, since the components may move when `path` is this one.
    std::size_t const added = path.components_.size();
    for (std::size_t i = 0; i < added; ++i) components_.push_back(path.components_[i]);
}

KFS_StreamID KFS_StreamIDPath::RemoveHead()
{
    KFS_StreamID const head = components_.front();
    components_.erase(components_.begin());
    return head;
}

KFS_StreamID KFS_StreamIDPath::RemoveTail()
{
    KFS_StreamID const tail = components_.back();
    components_.pop_back();
    return tail;
}

KFS_StreamIDPath KFS_StreamIDPath::GetParentPath() const
{
    KFS_StreamIDPath parent;
    parent.components_.assign(components_.begin(), components_.end() - 1);
    return parent;
}

bool KFS_StreamIDPath::IsEqualToTail(KFS_StreamID const& id) const
{
    return !IsEmpty() && GetTail() == id;
}

bool operator==(KFS_StreamIDPath const& a, KFS_StreamIDPath const& b)
{
    return a.components_ == b.components_;
}

bool operator<(KFS_StreamIDPath const& a, KFS_StreamIDPath const& b)
{
    return std::lexicographical_compare(a.components_.begin(), a.components_.end(), b.components_.begin(),
                                        b.components_.end());
}

bool KFS_StreamIDPath::IsEqualByMatchName(KFS_StreamIDPath const& other) const
{
    return std::equal(
        components_.begin(), components_.end(), other.components_.begin(), other.components_.end(),
        [](KFS_StreamID const& a, KFS_StreamID const& b) { return a.GetMatchName() == b.GetMatchName(); });
}

bool KFS_StreamIDPath::IsPrefixOf(KFS_StreamIDPath const& other) const
{
    return GetLength() < other.GetLength() &&
           std::equal(components_.begin(), components_.end(), other.components_.begin());
}

bool KFS_StreamIDPath::FindFirstInstanceOfMatchName(KFS_MatchName const& name, unsigned int* where) const
{
    auto const found = std::find_if(components_.begin(), components_.end(),
                                    [&](KFS_StreamID const& id) { return id.GetMatchName() == name; });
    bool const stands = found != components_.end();
    if (where) *where = stands ? static_cast<unsigned int>(found - components_.begin()) : KFS_StreamID::NoIndex;
    return stands;
}

bool KFS_StreamIDPath::HasTargetParent(KFS_MatchName const& name, unsigned int level) const
{
    return GetLength() >= level && GetComponent(level - 1).GetMatchName() == name;
}

hearth::utility::Guid KFS_StreamIDPath::MakeUID() const
{
    hearth::utility::Murmur3MixerState state;
    UpdateHashState(state, UIDSeed.data(), UIDSeed.size());
    for (KFS_StreamID const& id : components_) {
        unsigned int const index = id.GetIndex();
        unsigned char const indexBytes[4] = {static_cast<unsigned char>(index), static_cast<unsigned char>(index >> 8),
                                             static_cast<unsigned char>(index >> 16),
                                             static_cast<unsigned char>(index >> 24)};
        UpdateHashState(state, indexBytes, sizeof indexBytes);
        unsigned char nameBytes[16];
        GuidToBytes(id.GetMatchName().GetGuid(), nameBytes);
        UpdateHashState(state, nameBytes, sizeof nameBytes);
    }
    hearth::utility::Guid uid;
    GetHashResult(state, uid);
    return uid;
}

KFS_StreamIDPath KFS_FindFromReverse(KFS_MatchName const& name, KFS_StreamIDPath const& path)
{
    KFS_StreamID const wanted(name);
    std::vector<KFS_StreamID> const& components = path.GetPathConst();
    auto const found = std::find(components.rbegin(), components.rend(), wanted);
    KFS_StreamIDPath result;
    result.GetPath().assign(components.begin(), found.base());
    return result;
}
