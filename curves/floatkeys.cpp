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

namespace {

// The keys between two anchors, and the speed graph from the one to the other.
class FloatRun {
public:
    FloatRun(KFS_Stream const* stream, KFS_StreamKeyData* data) : stream_(stream), data_(data) {}

    // Finds the anchors around a key and builds the graph. False, without an error, where no key lies between anchors.
    bool Begin(int index, int* code);
    // Gives the float keys from `first` to `last` their times, as far as they lie in the run, and answers behind which
    // key it stopped.
    int Place(int first, int last, int* placed);

private:
    int BuildGraph();
    int ProposeTime(double s, long long* time);
    int PlaceKey(int index, KFS_KeyScalar* key, double s);
    int MakeFree(int index, int* time) const;

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

int GetKey(KFS_StreamKeyData const* data, int index, KFS_KeyScalar** key)
{
    KFS_KeyScalar const* item = nullptr;
    int const code = KFSp_GetConstKey(data, index, &item);
    *key = const_cast<KFS_KeyScalar*>(item);
    return code;
}

bool FloatRun::Begin(int index, int* code)
{
    *code = KFSp_GetNeighborsFromIndex(stream_, index, 0, &prev_, &next_, &prevIndex_, &nextIndex_);
    if (*code != 0 || !prev_ || !next_ || nextIndex_ - prevIndex_ < 2) return false;
    *code = KFSp_SumArcs(data_, prevIndex_, nextIndex_, &total_);
    if (*code == 0) {
        *code = BuildGraph();
    }
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

// Moves the time until no other key stands there: away from a later key to the past, from an earlier one to the future.
int FloatRun::MakeFree(int index, int* time) const
{
    int const tries = 10 * KFSp_ItemCount(data_);
    int twoTriesAgo = 0;
    int code = 0;
    for (int i = 0; i < tries; ++i) {
        T_Time const at{*time, stream_->GetTimeScale()};
        int found = KFS_INVALID_INDEX;
        code = KFS_TimeToIndex(stream_, &at, &found);
        if (code != 0 || found == KFS_INVALID_INDEX || found == index) break;
        bool const even = i % 2 == 0;
        if (even) {
            twoTriesAgo = *time;
        }
        *time = KFSp_TimeDifference(*time, found > index ? 1 : -1);
        // Between two taken times it would swing to and fro until the tries, an even number, are used up.
        if (!even && *time == twoTriesAgo) break;
    }
    return code;
}

int FloatRun::PlaceKey(int index, KFS_KeyScalar* key, double s)
{
    long long proposed = 0;
    if (int const code = ProposeTime(s, &proposed); code != 0) return code;
    // Each key of the run needs its own unit of time.
    long long const earliest = static_cast<long long>(prev_->time) + (index - prevIndex_);
    long long const latest = static_cast<long long>(next_->time) - (nextIndex_ - index);
    auto time = static_cast<int>(std::min(std::max(proposed, earliest), latest));
    int const code = MakeFree(index, &time);
    // Until the whole run has its times the list isn't in order, and the lookup may miss the key before.
    if (settledIndex_ == index - 1 && time <= settledTime_) {
        time = settledTime_ + 1;
    }
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
        if (int const code = GetKey(data_, i, &key); code != 0) return code;
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
        if (int const code = GetKey(data, i, &key); code != 0) return code;
        if (!KFSp_Floats(key)) continue;
        int code = KFSp_CheckPathDimension(stream);
        FloatRun run(stream, data);
        if (code == 0 && run.Begin(i, &code)) {
            code = run.Place(i, last, &i);
        }
        if (code != 0) return code;
    }
    return 0;
}

}  // namespace

int KFSp_ComputeFloatTime(KFS_Stream const* stream, int index)
{
    if (int const code = KFSp_CheckPathDimension(stream); code != 0) return code;
    return PlaceFloatKeys(stream, index, index);
}

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
