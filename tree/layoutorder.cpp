#include "tree/layoutorder_private.h"

#include <algorithm>
#include <numeric>

namespace {

// The first of the sorted keys that isn't less, or their number. Without branches, since what is asked for is as random
// as a hash.
std::size_t LowerBound(std::vector<std::uint64_t> const& keys, std::uint64_t key)
{
    std::uint64_t const* base = keys.data();
    for (std::size_t count = keys.size(); count > 1;) {
        std::size_t const half = count / 2;
        base += half & (std::size_t{0} - static_cast<std::size_t>(base[half - 1] < key));
        count -= half;
    }
    return static_cast<std::size_t>(base - keys.data()) + (!keys.empty() && *base < key ? 1 : 0);
}

}  // namespace

KFSp_LayoutOrder::KFSp_LayoutOrder(KFS_CanonicalLayout const& layout)
    : slotOf_(layout.size()),
      positionOf_(layout.size())
{
    std::iota(positionOf_.begin(), positionOf_.end(), 0U);
    std::stable_sort(positionOf_.begin(), positionOf_.end(), [&layout](unsigned int a, unsigned int b) {
        return layout[a]->GetMatchName() < layout[b]->GetMatchName();
    });
    for (unsigned int const position : positionOf_) {
        slotOf_[position] = static_cast<unsigned int>(slots_.size());
        slots_.push_back(const_cast<KFS_StreamBase*>(layout[position]));
        names_.push_back(layout[position]->GetMatchName());
        keys_.push_back(names_.back().GetGuid().Half(0));
    }
    for (unsigned int position = 0; position < layout.size(); ++position)
        if (layout[position]->IsGroup()) subgroups_.push_back(position);
}

unsigned int KFSp_LayoutOrder::Find(KFS_MatchName const& name) const
{
    std::uint64_t const key = name.GetGuid().Half(0);
    for (std::size_t slot = LowerBound(keys_, key); slot < keys_.size() && keys_[slot] == key; ++slot)
        if (names_[slot] == name) return static_cast<unsigned int>(slot);
    return None;
}
