// Edits of plain streams without the detour through the cache record. Apart, because each leaves to the bit what the
// general way (edit.cpp, insertfromcache.cpp) leaves, and nothing else: whoever changes one changes both.

#include "keystore/plainkeys_private.h"

#include "keystore/curvehooks_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/savedrecords_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cstring>
#include <numeric>
#include <optional>

namespace {

[[gnu::always_inline]] inline bool IsPlain(KFS_Stream const* stream)
{
    return !stream->IsSpatial() && stream->HasKeys() && !KFSp_HasCustomRecords(stream) && !stream->GetCopyItemFunc() &&
           !stream->GetDisposeItemFunc();
}

// Codes that are given, have a shape and are allowed.
[[gnu::always_inline]] inline bool CanTake(KFS_Stream const* stream, char inInterp, char outInterp)
{
    unsigned int const mask = stream->GetInterpMask();
    auto const can = [mask](char code) {
        return code >= KFS_Interp_Linear && code <= KFS_Interp_Hold && (mask >> (code - 1) & 1U) != 0;
    };
    return can(inInterp) && can(outInterp);
}

bool HasSplineSide(char inInterp, char outInterp)
{
    return inInterp == KFS_Interp_Spline || outInterp == KFS_Interp_Spline;
}

// A range as it always is: both ends or none, and within the list.
bool IsWhole(int const (&range)[2], int count)
{
    return (range[0] == KFS_INVALID_INDEX) == (range[1] == KFS_INVALID_INDEX) && range[1] < count;
}

// The stream's own key data, as long as nothing about it is out of the ordinary; null where something is.
[[gnu::always_inline]] inline KFS_StreamKeyData* OrdinaryKeys(KFS_Stream* stream)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    int const count = KFSp_ItemCount(data);
    bool const ordinary =
        data->stream == stream && IsWhole(data->invalidKeyIndex, count) && IsWhole(data->arcInvalidKeyIndex, count);
    return ordinary ? data : nullptr;
}

void Widen(int (&range)[2], int first, int last)
{
    range[0] = range[0] == KFS_INVALID_INDEX ? first : std::min(range[0], first);
    range[1] = std::max(range[1], last);
}

// What insertions at `first` to `last` mark in a list that has `count` keys now (staleranges.cpp).
[[gnu::always_inline]] inline void MarkInserted(KFS_StreamKeyData* data, int first, int last, int count)
{
    Widen(data->invalidKeyIndex, std::max(first - 1, 0), std::min(last + 1, count - 1));
    Widen(data->arcInvalidKeyIndex, std::max(first - 2, 0), std::min(last + 2, count - 1));
}

// A new key without neighbours has no handles; any other one has, on which its sides agree. Behind all others they are at
// rest. The same bytes but for the time are what the general way leaves in the cache record, by which the key came in.
[[gnu::always_inline]] inline void WriteKey(unsigned char* place, int time, char inInterp, char outInterp, bool isFirst,
                                            double const* value, int dimension)
{
    auto* const key = reinterpret_cast<KFS_KeyScalar*>(place);
    bool const hasHandles = !isFirst && HasSplineSide(inInterp, outInterp);
    key->time = time;
    key->inInterp = static_cast<signed char>(inInterp);
    key->outInterp = static_cast<signed char>(outInterp);
    key->flags = hasHandles ? KFS_KeyFlag_Continuous : 0;
    double const influence = hasHandles ? KFSp_OneSixth : 0.0;
    auto* const numbers = reinterpret_cast<double*>(place + KFS_KeyHeadSize);
    auto const fill = [&](int size) {
        KFSp_TemporalRuns<double> const runs(numbers, size);
        for (int i = 0; i < size; ++i) {
            std::memcpy(runs.value + i, value + i, sizeof(double));
            runs.inSpeed[i] = 0.0;
            runs.inInfluence[i] = influence;
            runs.outSpeed[i] = 0.0;
            runs.outInfluence[i] = influence;
        }
    };
    if (dimension == 1)  // by far the most, and no loop then
        fill(1);
    else
        fill(dimension);
}

}  // namespace

bool KFSp_AppendPlainKey(KFS_Stream* stream, T_Time const* time, double const* value, char inInterp, char outInterp)
{
    if (!time || !value || time->scale != stream->GetTimeScale() || time->scale == 0 || !IsPlain(stream) ||
        !CanTake(stream, inInterp, outInterp))
        return false;
    KFS_StreamKeyData* const data = OrdinaryKeys(stream);
    if (!data || !data->keys) return false;
    int const count = (*data->keys)->count;
    unsigned char* const room = KFSp_GetRoom(data->keys, 1);
    if (!room || !data->times.Mirrors(count) || !data->times.Append(time->value)) return false;
    int const dimension = stream->GetDimension();
    WriteKey(room, time->value, inInterp, outInterp, false, value, dimension);
    WriteKey(reinterpret_cast<unsigned char*>(data->cache), KFS_INVALID_INDEX, inInterp, outInterp, false, value,
             dimension);
    KFSp_TakeRoom(data->keys, 1);
    MarkInserted(data, count, count, count + 1);
    return true;
}

bool KFSp_RemoveLastPlainKey(KFS_Stream* stream, int index)
{
    if (!IsPlain(stream)) return false;
    KFS_StreamKeyData* const data = OrdinaryKeys(stream);
    int const count = data ? KFSp_ItemCount(data) : 0;
    if (count < 2 || index != count - 1 || !data->times.Mirrors(count) || !KFSp_DropLastItem(data->keys)) return false;
    data->times.RemovedLast();
    int const last = index - 1;
    Widen(data->invalidKeyIndex, last, last);
    data->invalidKeyIndex[1] = std::min(data->invalidKeyIndex[1], last);
    data->arcInvalidKeyIndex[1] = std::min(data->arcInvalidKeyIndex[1], last);
    data->cache->time = KFS_INVALID_INDEX;
    return true;
}

// ---- many at once

namespace {

// A batch in the order of time, and where it goes.
class Batch {
public:
    Batch(KFS_Stream* stream, KFS_NewKeys const& keys) : stream_(stream), keys_(keys) {}

    // Whether the short way may be gone as far as can be seen without the stream's keys.
    bool Prepare();
    bool Insert();

private:
    bool HasAllHandles() const
    {
        return keys_.inSpeeds && keys_.inInfluences && keys_.outSpeeds && keys_.outInfluences;
    }
    bool HasHandles() const { return keys_.inSpeeds || keys_.inInfluences || keys_.outSpeeds || keys_.outInfluences; }
    bool AreCodesPlain();
    bool SortTimes();
    bool MakeRoom();
    bool Merge();
    void Append();
    int LastSource() const;
    void LeaveInCache(int index) const;
    int Source(int i) const { return order_ ? order_[i] : i; }
    void Write(unsigned char* place, int i) const;
    void WriteNumbers(unsigned char* place, std::size_t stride) const;

    KFS_Stream* stream_;
    KFS_NewKeys const& keys_;
    std::optional<KFSp_ScBytes> room_;
    KFS_StreamKeyData* data_ = nullptr;
    int count_ = 0;               // of the stream's keys before
    int const* times_ = nullptr;  // ascending, in the stream's scale
    int const* order_ = nullptr;  // which of the batch's keys each one is; null: as they stand
    bool wantsOrder_ = false;     // handles follow from who came before
};

// Whether all bytes are one.
bool AreAlike(char const* bytes, int count)
{
    return std::memcmp(bytes, bytes + 1, static_cast<std::size_t>(count) - 1) == 0;
}

bool Batch::AreCodesPlain()
{
    if (AreAlike(keys_.inInterps, keys_.count) && AreAlike(keys_.outInterps, keys_.count)) {
        wantsOrder_ = !HasAllHandles() && HasSplineSide(*keys_.inInterps, *keys_.outInterps);
        return CanTake(stream_, *keys_.inInterps, *keys_.outInterps);
    }
    for (int i = 0; i < keys_.count; ++i) {
        char const in = keys_.inInterps[i];
        char const out = keys_.outInterps[i];
        bool const asBefore = i > 0 && in == keys_.inInterps[i - 1] && out == keys_.outInterps[i - 1];
        if (!asBefore && !CanTake(stream_, in, out)) return false;
        wantsOrder_ = wantsOrder_ || (!HasAllHandles() && HasSplineSide(in, out));
    }
    return true;
}

bool Ascend(std::span<int const> times)
{
    int falls = 0;  // counted without a way out, several at a time
    for (std::size_t i = 1; i < times.size(); ++i) falls |= times[i - 1] < times[i] ? 0 : 1;
    return falls == 0;
}

// Converted and, if they don't ascend as they stand, sorted. False for times that make no ascending list of numbers.
bool Batch::SortTimes()
{
    auto const count = static_cast<std::size_t>(keys_.count);
    unsigned int const scale = stream_->GetTimeScale();
    times_ = keys_.times;
    if (keys_.timeScale != scale || scale == 0 || !Ascend({times_, count})) {
        room_.emplace(2 * sizeof(int) * count);
        auto* const times = static_cast<int*>(room_->get());
        if (!times) return false;
        for (std::size_t i = 0; i < count; ++i)
            if (T_ShortConvTime(keys_.times[i], keys_.timeScale, scale, &times[i]) != 0) return false;
        times_ = times;
        if (!Ascend({times, count})) {
            if (wantsOrder_) return false;
            int* const order = times + count;
            std::iota(order, order + count, 0);
            std::sort(order, order + count, [times](int a, int b) { return times[a] < times[b]; });
            order_ = order;
            std::sort(times, times + count);
            if (!Ascend({times, count})) return false;
        }
    }
    return times_[0] != KFS_INVALID_INDEX;
}

bool Batch::Prepare()
{
    return keys_.values && keys_.inInterps && keys_.outInterps && IsPlain(stream_) && !stream_->IsFloatBased() &&
           HasHandles() == HasAllHandles() && AreCodesPlain() && SortTimes();
}

// Room that grows as that of single insertions does, so that many small batches don't copy the list each time.
bool Batch::MakeRoom()
{
    SEQ_Head** const list = data_->keys;
    if (KFSp_GetRoom(list, keys_.count)) return true;
    if (!KFSp_HasShortcuts || (*list)->copy || (*list)->dispose || keys_.count > INT_MAX - count_) return false;
    int const half = std::min(count_ / 2, INT_MAX - count_);
    return SEQ_ReserveSpace(count_ + std::max(keys_.count, half), list) == 0;
}

double LimitToUnit(double influence)
{
    return influence < 0.0 ? 0.0 : influence > 1.0 ? 1.0 : influence;
}

[[gnu::always_inline]] inline void Batch::Write(unsigned char* place, int i) const
{
    int const source = Source(i);
    int const dimension = stream_->GetDimension();
    std::ptrdiff_t const first = std::ptrdiff_t{source} * dimension;
    WriteKey(place, times_[i], keys_.inInterps[source], keys_.outInterps[source], count_ == 0 && source == 0,
             keys_.values + first, dimension);
    if (!HasAllHandles()) return;
    auto* const numbers = reinterpret_cast<double*>(place + KFS_KeyHeadSize);
    auto const fill = [&](int size) {
        KFSp_TemporalRuns<double> const runs(numbers, size);
        for (int c = 0; c < size; ++c) {
            runs.inSpeed[c] = keys_.inSpeeds[first + c];
            runs.inInfluence[c] = LimitToUnit(keys_.inInfluences[first + c]);
            runs.outSpeed[c] = keys_.outSpeeds[first + c];
            runs.outInfluence[c] = LimitToUnit(keys_.outInfluences[first + c]);
        }
    };
    if (dimension == 1)
        fill(1);
    else
        fill(dimension);
}

// What Write does for each key of the commonest batch, of one number and four of handles a key, as it stands.
void Batch::WriteNumbers(unsigned char* place, std::size_t stride) const
{
    KFS_NewKeys const keys = keys_;  // whose pointers stay in registers
    int const* const times = times_;
    bool const isFirst = count_ == 0;
    for (int i = 0; i < keys.count; ++i, place += stride) {
        char const in = keys.inInterps[i];
        char const out = keys.outInterps[i];
        unsigned short const flags = HasSplineSide(in, out) && !(isFirst && i == 0) ? KFS_KeyFlag_Continuous : 0;
        auto* const key = reinterpret_cast<KFS_KeyScalar*>(place);
        key->time = times[i];
        key->inInterp = static_cast<signed char>(in);
        key->outInterp = static_cast<signed char>(out);
        key->flags = flags;
        auto* const numbers = reinterpret_cast<double*>(place + KFS_KeyHeadSize);
        numbers[0] = keys.values[i];
        numbers[1] = keys.inSpeeds[i];
        numbers[2] = LimitToUnit(keys.inInfluences[i]);
        numbers[3] = keys.outSpeeds[i];
        numbers[4] = LimitToUnit(keys.outInfluences[i]);
    }
}

// Among the keys that are there: from the last one down, each block moves once to where it ends up.
bool Batch::Merge()
{
    KFS_KeyTimes const& times = data_->times;
    int const marked[] = {data_->invalidKeyIndex[1], data_->arcInvalidKeyIndex[1]};
    int shifts[] = {0, 0};
    for (int i = 0; i < keys_.count; ++i) {
        int const position = times.LowerBound(times_[i]);
        if (position < count_ && times[position] == times_[i]) return false;
        for (int r = 0; r < 2; ++r) shifts[r] += position <= marked[r];
    }
    unsigned char* const end = KFSp_GetRoom(data_->keys, keys_.count);
    auto const stride = static_cast<std::size_t>((*data_->keys)->stride);
    auto const at = [&](int index) { return end - static_cast<std::size_t>(count_ - index) * stride; };
    int below = count_;  // keys that have not moved yet
    int first = 0;
    for (int i = keys_.count - 1; i >= 0; --i) {
        first = times.LowerBound(times_[i]);
        unsigned char* const place = at(first) + static_cast<std::size_t>(i) * stride;
        std::memmove(place + stride, at(first), static_cast<std::size_t>(below - first) * stride);
        Write(place, i);
        below = first;
    }
    int const last = times.LowerBound(times_[keys_.count - 1]) + keys_.count - 1;
    KFSp_TakeRoom(data_->keys, keys_.count);
    data_->times.Drop();
    if (marked[0] != KFS_INVALID_INDEX) data_->invalidKeyIndex[1] += shifts[0];
    if (marked[1] != KFS_INVALID_INDEX) data_->arcInvalidKeyIndex[1] += shifts[1];
    MarkInserted(data_, first, last, count_ + keys_.count);
    return true;
}

void Batch::Append()
{
    unsigned char* place = KFSp_GetRoom(data_->keys, keys_.count);
    auto const stride = static_cast<std::size_t>((*data_->keys)->stride);
    if (stream_->GetDimension() == 1 && HasAllHandles() && !order_)
        WriteNumbers(place, stride);
    else
        for (int i = 0; i < keys_.count; ++i, place += stride) Write(place, i);
    KFSp_TakeRoom(data_->keys, keys_.count);
    data_->times.Appended({times_, static_cast<std::size_t>(keys_.count)});
    MarkInserted(data_, count_, count_ + keys_.count - 1, count_ + keys_.count);
}

// Which one of the batch, in the order of time, is the last of the caller's order.
int Batch::LastSource() const
{
    int const last = keys_.count - 1;
    return order_ ? static_cast<int>(std::find(order_, order_ + last, last) - order_) : last;
}

// One by one the caller's last key, which stands at `index`, would have come last: it stays in the cache record as it
// went into the list, which is with the handles that followed from the keys beside it. Those that the caller gives go
// into the list alone.
void Batch::LeaveInCache(int index) const
{
    KFS_KeyScalar* const cache = data_->cache;
    int const last = keys_.count - 1;
    int const dimension = stream_->GetDimension();
    char const in = keys_.inInterps[last], out = keys_.outInterps[last];
    WriteKey(reinterpret_cast<unsigned char*>(cache), KFS_INVALID_INDEX, in, out, count_ + last == 0,
             keys_.values + std::ptrdiff_t{last} * dimension, dimension);
    if (!HasSplineSide(in, out) || index == 0 || index == count_ + last) return;
    auto const stride = static_cast<std::size_t>((*data_->keys)->stride);
    unsigned char* const before = (*data_->keys)->items + static_cast<std::size_t>(index - 1) * stride;
    KFSp_SetHandlesBetween(stream_, reinterpret_cast<KFS_KeyScalar*>(before),
                           reinterpret_cast<KFS_KeyScalar*>(before + 2 * stride), cache);
}

bool Batch::Insert()
{
    data_ = OrdinaryKeys(stream_);
    if (!data_ || KFSp_CreateKeyList(stream_) != 0) return false;
    count_ = KFSp_ItemCount(data_);
    bool found = false;
    int position = 0;
    // The search builds the packed times where there are none.
    if (KFSp_SearchKeys(data_, times_[0], &found, &position) != 0 || found) return false;
    bool const behind = position == count_;
    if (!data_->times.Mirrors(count_) || (wantsOrder_ && !behind)) return false;
    int const lowest = count_ > 0 ? std::min(data_->times[0], times_[0]) : times_[0];
    int const highest = std::max(count_ > 0 ? data_->times[count_ - 1] : times_[0], times_[keys_.count - 1]);
    bool const isShort = static_cast<unsigned int>(highest) - static_cast<unsigned int>(lowest) < 1U << 31;
    if (!isShort || (count_ > 0 && !data_->times.Ascends()) || !MakeRoom()) return false;
    int const last = LastSource();
    int const index = data_->times.LowerBound(times_[last]) + last;
    if (behind)
        Append();
    else if (!Merge())
        return false;
    LeaveInCache(index);
    return true;
}

}  // namespace

bool KFSp_InsertPlainKeys(KFS_Stream* stream, KFS_NewKeys const& keys)
{
    Batch batch(stream, keys);
    if (!batch.Prepare()) return false;
    bool const hadList = stream->GetKeys() != nullptr;
    if (batch.Insert()) return true;
    if (SEQ_Head** const made = hadList ? nullptr : stream->GetKeys()) {
        stream->SetKeys(nullptr);
        KFSp_DisposeKeyList(made);
    }
    return false;
}
