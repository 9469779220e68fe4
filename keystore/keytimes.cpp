#include "keystore/keytimes.h"

#include "keystore/keytypes.h"

#include <new>

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
        if (SEQ_GetConstAddress(keys, i, &item) != 0) {
            return false;
        }
        times_[static_cast<std::size_t>(i)] = static_cast<KFS_KeyScalar const*>(item)->time;
    }
    mirrors_ = true;
    return true;
}

void KFS_KeyTimes::Drop() noexcept
{
    mirrors_ = false;
    times_.clear();
}

void KFS_KeyTimes::Inserted(int index, int time) noexcept
{
    if (!mirrors_) {
        return;
    }
    try {
        times_.insert(times_.begin() + index, time);
    } catch (std::bad_alloc const&) {
        Drop();
    }
}

void KFS_KeyTimes::Removed(int index) noexcept
{
    if (mirrors_) {
        times_.erase(times_.begin() + index);
    }
}

void KFS_KeyTimes::Retimed(int index, int time) noexcept
{
    if (mirrors_) {
        times_[static_cast<std::size_t>(index)] = time;
    }
}

// By the difference with wrap-around, as the list sorts. The sign of the difference is turned into a step or none,
// because a branch on it would be mispredicted every other time.
int KFS_KeyTimes::LowerBound(int time) const noexcept
{
    auto const isBefore = [time](int other) {
        return (static_cast<unsigned int>(other) - static_cast<unsigned int>(time)) >> 31;
    };
    int const* base = times_.data();
    auto count = static_cast<unsigned int>(times_.size());
    if (count == 0) {
        return 0;
    }
    while (count > 1) {
        unsigned int const half = count / 2;
        base += half & (0U - isBefore(base[half - 1]));
        count -= half;
    }
    return static_cast<int>(base - times_.data()) + static_cast<int>(isBefore(*base));
}
