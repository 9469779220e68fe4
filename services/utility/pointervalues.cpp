#include "frame/services/byteorder.h"

#include <climits>
#include <mutex>
#include <unordered_map>
#include <unordered_set>

namespace {

bool IsFlat(void const* pointer) noexcept
{
    std::intptr_t const number = reinterpret_cast<std::intptr_t>(pointer);
    return number >= INT_MIN && number <= INT_MAX;
}

int FlatNumber(void const* pointer) noexcept
{
    return static_cast<int>(reinterpret_cast<std::intptr_t>(pointer));
}

// Which values stand for addresses in this run. Values are given out from the lower end of the numbers, where flat
// numbers are least likely, past those that were seen as flat numbers.
class AddressValues {
public:
    int ValueOf(void const* pointer)
    {
        std::lock_guard<std::mutex> const lock(mutex_);
        if (IsFlat(pointer) && !addresses_.contains(FlatNumber(pointer))) {
            flat_.insert(FlatNumber(pointer));
            return FlatNumber(pointer);
        }
        auto const known = values_.find(pointer);
        if (known != values_.end()) return known->second;
        while (flat_.contains(next_)) ++next_;
        auto const added = addresses_.emplace(next_, pointer).first;
        values_.emplace(pointer, next_);
        ++next_;
        return added->first;
    }

    void const* PointerOf(int value)
    {
        std::lock_guard<std::mutex> const lock(mutex_);
        auto const known = addresses_.find(value);
        if (known != addresses_.end()) return known->second;
        flat_.insert(value);
        return Q_IntPtrToPointer(value);
    }

private:
    std::mutex mutex_;
    std::unordered_map<void const*, int> values_;
    std::unordered_map<int, void const*> addresses_;
    std::unordered_set<int> flat_;
    int next_ = INT_MIN + 1;  // INT_MIN itself means "no index, no time" elsewhere
};

AddressValues& Values()
{
    static AddressValues* const values = new AddressValues;
    return *values;
}

}  // namespace

int Q_PointerToInt32(void const* pointer)
{
    return Values().ValueOf(pointer);
}

void* Q_Int32ToPointer(int value)
{
    return const_cast<void*>(Values().PointerOf(value));
}
