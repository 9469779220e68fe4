#pragma once

#include "tree/streamgroup.h"

#include <cstdint>
#include <vector>

// A layout sorted by match name, made once for all groups of a type. A position counts in display order, a slot in the
// order of the names.
class KFSp_LayoutOrder : public Q_MemTrackedObject {
public:
    explicit KFSp_LayoutOrder(KFS_CanonicalLayout const& layout);

    static constexpr unsigned int None = ~0U;

    // The canonical instances, by slot: what a group's children are before anybody edits one.
    std::vector<KFS_StreamBase*> const& Slots() const { return slots_; }
    // The positions that are groups.
    std::vector<unsigned int> const& Subgroups() const { return subgroups_; }
    unsigned int SlotOf(unsigned int position) const { return slotOf_[position]; }
    unsigned int PositionOf(unsigned int slot) const { return positionOf_[slot]; }
    bool IsAt(unsigned int position, KFS_MatchName const& name) const
    {
        return position < slotOf_.size() && names_[slotOf_[position]] == name;
    }
    // The slot of a name, or None.
    unsigned int Find(KFS_MatchName const& name) const;

private:
    std::vector<KFS_StreamBase*> slots_;
    std::vector<std::uint64_t> keys_;  // the beginning of each slot's name, side by side for the search
    std::vector<KFS_MatchName> names_;
    std::vector<unsigned int> slotOf_;
    std::vector<unsigned int> positionOf_;
    std::vector<unsigned int> subgroups_;
};
