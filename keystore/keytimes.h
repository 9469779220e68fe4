#pragma once

#include "frame/export.h"
#include "frame/services/memory.h"
#include "frame/services/sequence.h"

#include <span>
#include <vector>

// The times of a key list's records, packed side by side so that a search touches a few cache lines instead of one a
// record. It mirrors the list: whoever inserts, removes or retimes a key tells it, and an index that can't follow is
// dropped and built anew by the next search. It never decides a result: without memory for it searches go through the
// list itself.
//
// Threads: belongs to one key data, and is built by reads.
class KFS_API KFS_KeyTimes {
public:
    // The list's keys from scratch. False, and dropped, when memory is out or the list can't be read.
    bool Build(SEQ_Head const* const* keys);
    void Drop() noexcept;

    // Whether it mirrors a list of that many keys.
    bool Mirrors(int count) const noexcept { return mirrors_ && static_cast<int>(times_.size()) == count; }

    void Inserted(int index, int time) noexcept;
    void Removed(int index) noexcept;
    void Retimed(int index, int time) noexcept;
    // Keys behind all others, whose times ascend as numbers from the last one's on; of an empty list any list of times.
    void Appended(std::span<int const> times) noexcept;
    // Whether they ascend as numbers, from the first to the last, without wrap-around.
    bool Ascends() const noexcept { return ordered_; }
    // A key behind all others. False, and nothing done, where that isn't plain to see or takes memory.
    bool Append(int time) noexcept;
    // The last of several keys goes.
    void RemovedLast() noexcept;

    // The number of keys before `time`: the index of the first key at or after it. Reads mostly walk along the time
    // line, so the last answer and the one after it are tried first where the last search found them right. That never
    // changes an answer, only what it costs.
    int LowerBound(int time) const noexcept;
    int operator[](int index) const noexcept { return times_[static_cast<std::size_t>(index)]; }

    // Whether all times ascend as numbers and lie within Near of zero, so that their order and that of any other such
    // time is the order of numbers: differences can't wrap around.
    bool IsNarrow() const noexcept { return narrow_; }
    static bool IsNear(int time) noexcept
    {
        return static_cast<unsigned int>(time) + static_cast<unsigned int>(Near) < 2U * static_cast<unsigned int>(Near);
    }
    int const* Data() const noexcept { return times_.data(); }

private:
    static constexpr int Near = 1 << 30;

    int Search(int time) const noexcept;
    void Changed() noexcept;

    std::vector<int, Q_Allocator<int>> times_;
    int falls_ = 0;  // how many times, as numbers, aren't above the one before
    bool mirrors_ = false;
    bool ordered_ = false;          // ascending also without wrap-around, so that neighbours enclose a time for sure
    bool narrow_ = false;           // ordered_, and all of them within Near of zero
    mutable bool walking_ = false;  // the last search ended where the one before did, or one key on
    mutable int last_ = 0;
};

[[gnu::always_inline]] inline int KFS_KeyTimes::LowerBound(int time) const noexcept
{
    if (walking_) {
        int const* const at = times_.data() + last_;  // there is a key before it and one after it
        if (at[-1] < time) {
            if (time <= at[0]) return last_;
            if (time <= at[1]) {
                int const next = last_ + 1;
                if (next + 1 < static_cast<int>(times_.size())) last_ = next;
                return next;
            }
        }
    }
    return Search(time);
}

[[gnu::always_inline]] inline bool KFS_KeyTimes::Append(int time) noexcept
{
    bool const follows = ordered_ && times_.size() < times_.capacity() && times_.back() < time &&
                         static_cast<unsigned int>(time) - static_cast<unsigned int>(times_.front()) < 1U << 31;
    if (!follows) return false;
    times_.push_back(time);
    narrow_ = narrow_ && IsNear(time);
    walking_ = false;
    return true;
}

inline void KFS_KeyTimes::RemovedLast() noexcept
{
    if (!ordered_)
        Removed(static_cast<int>(times_.size()) - 1);
    else
        times_.pop_back();
    walking_ = false;
}
