// The packed times and the search in them, which knows nothing of records beyond where their time stands.

#include "keystore/keytimes.h"

#include "keystore/keytypes.h"

#include <new>
#include <span>

namespace {

// 1 where the time at an index isn't above the one before it, else 0; an index beside the list is fine.
int FallsTo(std::span<int const> times, int index)
{
    auto const at = static_cast<std::size_t>(index);
    return index > 0 && at < times.size() && times[at - 1] >= times[at] ? 1 : 0;
}

}  // namespace

bool KFS_KeyTimes::Build(SEQ_Head const* const* keys)
{
    Drop();
    int const count = (*keys)->count;
    try {
        times_.resize(static_cast<std::size_t>(count));
    } catch (std::bad_alloc const&) {
        return false;
    }
    for (int i = 0; i < count; ++i) {
        void const* item = nullptr;
        if (SEQ_GetConstAddress(keys, i, &item) != 0) return false;
        times_[static_cast<std::size_t>(i)] = static_cast<KFS_KeyScalar const*>(item)->time;
    }
    for (int i = 1; i < count; ++i) falls_ += FallsTo(times_, i);
    mirrors_ = true;
    Changed();
    return true;
}

void KFS_KeyTimes::Drop() noexcept
{
    mirrors_ = false;
    times_.clear();
    falls_ = 0;
    Changed();
}

// The times of a list that spans less than half of the 32-bit circle ascend as numbers too; of a longer one nothing is
// foretold, since which key comes first depends on where one looks from. Nor of one that is out of order for a while,
// as lists are in which float keys get their times.
void KFS_KeyTimes::Changed() noexcept
{
    walking_ = false;
    ordered_ = !times_.empty() && falls_ == 0 &&
               static_cast<unsigned int>(times_.back()) - static_cast<unsigned int>(times_.front()) < 1U << 31;
    narrow_ = ordered_ && IsNear(times_.front()) && IsNear(times_.back());
}

void KFS_KeyTimes::Inserted(int index, int time) noexcept
{
    if (!mirrors_) return;
    int const fall = FallsTo(times_, index);
    try {
        times_.insert(times_.begin() + index, time);
        falls_ += FallsTo(times_, index) + FallsTo(times_, index + 1) - fall;
    } catch (std::bad_alloc const&) {
        Drop();
    }
    Changed();
}

void KFS_KeyTimes::Removed(int index) noexcept
{
    if (mirrors_) {
        falls_ -= FallsTo(times_, index) + FallsTo(times_, index + 1);
        times_.erase(times_.begin() + index);
        falls_ += FallsTo(times_, index);
        Changed();
    }
}

void KFS_KeyTimes::Retimed(int index, int time) noexcept
{
    if (mirrors_) {
        falls_ -= FallsTo(times_, index) + FallsTo(times_, index + 1);
        times_[static_cast<std::size_t>(index)] = time;
        falls_ += FallsTo(times_, index) + FallsTo(times_, index + 1);
        Changed();
    }
}

void KFS_KeyTimes::Appended(std::span<int const> times) noexcept
{
    try {
        times_.insert(times_.end(), times.begin(), times.end());
        mirrors_ = true;
        Changed();
    } catch (std::bad_alloc const&) {
        Drop();
    }
}

namespace {

// The number of the `count` times, at least one, that lie before another, by an order that `isBefore` tells. Written so
// that compilers choose between two addresses: a branch would be mispredicted every other time.
template <class IsBefore>
[[gnu::always_inline]] inline int CountBefore(int const* times, unsigned int count, IsBefore isBefore)
{
    int const* base = times;
    while (count > 1) {
        unsigned int const half = count / 2;
        int const* const middle = base + half;
        base = isBefore(middle[-1]) ? middle : base;
        count -= half;
    }
    return static_cast<int>(base - times) + (isBefore(*base) ? 1 : 0);
}

}  // namespace

int KFS_KeyTimes::Search(int time) const noexcept
{
    auto const all = static_cast<unsigned int>(times_.size());
    if (all == 0) return 0;
    // Keys are mostly added at the end.
    if (ordered_ && times_.back() < time &&
        static_cast<unsigned int>(time) - static_cast<unsigned int>(times_.front()) < 1U << 31)
        return static_cast<int>(all);
    int const found =
        narrow_ && IsNear(time)
            ? CountBefore(times_.data(), all, [time](int other) { return other < time; })
            : CountBefore(times_.data(), all, [time](int other) {  // as the list sorts
                  return static_cast<int>(static_cast<unsigned int>(other) - static_cast<unsigned int>(time)) < 0;
              });
    walking_ =
        ordered_ && static_cast<unsigned int>(found - last_) <= 1 && found > 0 && found < static_cast<int>(all) - 1;
    last_ = found;
    return found;
}
