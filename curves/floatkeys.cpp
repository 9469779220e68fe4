// Times of float keys, from the speed graph between their anchors: the last stage of the update pass, their only writer.
#include "curves/floatkeys.h"

#include "curves/arcs_private.h"
#include "curves/floatkeys_private.h"
#include "curves/neighbours_private.h"
#include "curves/segment_private.h"
#include "keystore/keyflags.h"
#include "keystore/keylist_private.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <numeric>

namespace {

// The keys between two anchors, and the speed graph from the one to the other.
class FloatRun {
public:
    FloatRun(KFS_Stream const* stream, KFS_StreamKeyData* data) : stream_(stream), data_(data) {}

    // Finds the anchors around a key and builds the graph. False, without an error, where no key lies between anchors.
    bool Begin(int index, int* code);
    // The last key that has the same neighbours as the one that the run began with.
    int Last() const { return next_ ? nextIndex_ - 1 : KFSp_ItemCount(data_) - 1; }
    // Gives the float keys from `first` to `last` their times, as far as they lie in the run, and answers behind which
    // key it stopped.
    int Place(int first, int last, int* placed);

private:
    int BuildGraph();
    int ProposeTime(double s, long long* time);
    int PlaceKey(int index, KFS_KeyScalar* key, double s);
    int MakeFree(int index, int* time) const;
    int GetEndOfBlock(int found, int index, KFS_KeyScalar** key) const;

    KFS_Stream const* stream_;
    KFS_StreamKeyData* data_;
    KFS_KeyScalar* prev_ = nullptr;
    KFS_KeyScalar* next_ = nullptr;
    int prevIndex_ = 0;
    int nextIndex_ = 0;
    double total_ = 0.0;
    KFSp_SegmentCurve graph_{2};
    // The key that got its time last, behind which the next one stays.
    int settledIndex_ = KFS_INVALID_INDEX;
    int settledTime_ = 0;
};

bool FloatRun::Begin(int index, int* code)
{
    *code = KFSp_GetNeighborsFromIndex(stream_, index, 0, &prev_, &next_, &prevIndex_, &nextIndex_);
    if (*code != 0 || !prev_ || !next_ || nextIndex_ - prevIndex_ < 2) return false;
    *code = KFSp_SumArcs(data_, prevIndex_, nextIndex_, &total_);
    if (*code == 0) *code = BuildGraph();
    return *code == 0;
}

int FloatRun::BuildGraph()
{
    if (KFSp_GetSegmentKind(prev_->outInterp, next_->inInterp) != KFSp_SegmentKind::Curved) return 0;
    double const dt = KFSp_Seconds(next_->time, prev_->time, stream_->GetTimeScale());
    KFSp_FillSpeedGraph(prev_, next_, total_, dt, graph_.curve);
    return CRV_CurveSetNonDecreasing(&graph_.curve, nullptr);
}

// The time at a part of the way between the anchors, its fraction of a unit cut off towards time 0. Keys that all lie
// on one point have no way.
long long LinearTime(double fraction, int from, int to)
{
    double const exact = static_cast<double>(KFSp_TimeDifference(to, from)) * fraction + static_cast<double>(from);
    if (!(exact >= static_cast<double>(INT_MIN) && exact <= static_cast<double>(INT_MAX))) return from;
    return static_cast<long long>(exact);
}

// The moment at which the speed graph reaches a distance. A hold stays at the earlier anchor, as do codes without a
// shape.
int FloatRun::ProposeTime(double s, long long* time)
{
    *time = prev_->time;
    if (prev_->outInterp == KFS_Interp_Hold) return 0;
    switch (KFSp_GetSegmentKind(prev_->outInterp, next_->inInterp)) {
    case KFSp_SegmentKind::Linear: *time = LinearTime(s / total_, prev_->time, next_->time); return 0;
    case KFSp_SegmentKind::Curved: break;
    default: return 0;
    }
    double x = 0.0;
    if (int const code = CRV_EvaluateXFromY(&graph_.curve, &x, s); code != 0) return code;
    *time += T_FpLong2TimeValue(stream_->GetTimeScale(), x);
    return 0;
}

// Of the keys that stand one unit of time after the other from `found` on towards `index`, the one nearest to `index`.
// The difference of a key's time and index never falls along the list, so a block is where it stays the same.
int FloatRun::GetEndOfBlock(int found, int index, KFS_KeyScalar** key) const
{
    int code = KFSp_GetKey(data_, found, key);
    long long const difference = code == 0 ? static_cast<long long>((*key)->time) - found : 0;
    for (int inside = found, outside = index; code == 0 && std::abs(outside - inside) > 1;) {
        int const middle = std::midpoint(inside, outside);
        KFS_KeyScalar* probe = nullptr;
        code = KFSp_GetKey(data_, middle, &probe);
        if (code == 0 && static_cast<long long>(probe->time) - middle == difference) {
            inside = middle;
            *key = probe;
        } else {
            outside = middle;
        }
    }
    return code;
}

// Moves the time until no other key stands there: away from a later key to the past, from an earlier one to the future.
// Not tick by tick, since keys may stand in blocks as long as the list. Behind a block there is room, or the key itself;
// or no room, with keys of the other side, which happens while a run is only in part placed.
int FloatRun::MakeFree(int index, int* time) const
{
    constexpr int tries = 4;  // of which keys in their order need two
    int direction = 0;
    for (int i = 0; i < tries; ++i) {
        T_Time const at{*time, stream_->GetTimeScale()};
        int found = KFS_INVALID_INDEX;
        if (int const code = KFS_TimeToIndex(stream_, &at, &found)) return code;
        if (found == KFS_INVALID_INDEX || found == index) break;
        int const away = found > index ? 1 : -1;
        if (away == -direction) break;
        direction = away;
        KFS_KeyScalar* end = nullptr;
        if (int const code = GetEndOfBlock(found, index, &end)) return code;
        *time = KFSp_TimeDifference(end->time, away);
    }
    return 0;
}

int FloatRun::PlaceKey(int index, KFS_KeyScalar* key, double s)
{
    long long proposed = 0;
    if (int const code = ProposeTime(s, &proposed); code != 0) return code;
    // Each key of the run needs its own unit of time.
    long long const earliest = static_cast<long long>(prev_->time) + (index - prevIndex_);
    long long const latest = static_cast<long long>(next_->time) - (nextIndex_ - index);
    auto time = static_cast<int>(std::min(std::max(proposed, earliest), latest));
    // What stands behind the key before can only move on to right behind it.
    bool const isSettledBefore = settledIndex_ == index - 1;
    int const code = isSettledBefore && time <= settledTime_ ? 0 : MakeFree(index, &time);
    // Until the whole run has its times the list isn't in order, and the lookup may miss the key before.
    if (isSettledBefore && time <= settledTime_) time = KFSp_TimeDifference(settledTime_, -1);
    KFSp_RetimeKey(data_, index, key, time);
    settledIndex_ = index;
    settledTime_ = time;
    return code;
}

int FloatRun::Place(int first, int last, int* placed)
{
    double s = prev_->arcLength;
    int const end = std::min(last, nextIndex_ - 1);
    for (int i = prevIndex_ + 1; i <= end; ++i) {
        KFS_KeyScalar* key = nullptr;
        if (int const code = KFSp_GetKey(data_, i, &key); code != 0) return code;
        if (i >= first && KFSp_Floats(key)) {
            if (int const code = PlaceKey(i, key, s); code != 0) return code;
        }
        s += key->arcLength;
    }
    *placed = end;
    return 0;
}

int PlaceFloatKeys(KFS_Stream const* stream, int first, int last)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    for (int i = first; i <= last; ++i) {
        KFS_KeyScalar* key = nullptr;
        if (int const code = KFSp_GetKey(data, i, &key); code != 0) return code;
        if (!KFSp_Floats(key)) continue;
        int code = KFSp_CheckPathDimension(stream);
        FloatRun run(stream, data);
        if (code == 0 && run.Begin(i, &code))
            code = run.Place(i, last, &i);
        else if (code == 0)
            i = run.Last();
        if (code != 0) return code;
    }
    return 0;
}

}  // namespace

int KFSp_ComputeFloatTimes(KFS_Stream const* stream, int first, int last)
{
    int const count = KFSp_ItemCount(stream->GetKeyData());
    first = std::max(first, 1);
    last = std::min(last, count - 2);
    if (first > last) return 0;
    return PlaceFloatKeys(stream, first, last);
}

int KFS_SetKeyFloat(KFS_Stream* stream, unsigned char on, int index)
{
    return KFS_SetKeyFlags(stream, index, KFS_KeyFlag_Float, on != 0 ? KFS_KeyFlag_Float : 0);
}
