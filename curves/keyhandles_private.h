#pragma once

#include "curves/neighbours_private.h"
#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"

// What the doors to a key's temporal handles share.

enum class KFSp_Side { In, Out };

// The handles of one side: `count` speeds and influences. A spatial key has one of each, a custom value has none.
template <class Number>
struct KFSp_Handles {
    Number* speed = nullptr;
    Number* influence = nullptr;
    int count = 0;
};

// Whether the keys' value data are runs of numbers with handles. While a custom stream carries a plain description its
// records still hold the client's bytes.
inline bool KFSp_HasHandleRuns(KFS_Stream const* stream)
{
    return !stream->IsSpatial() && !stream->IsCustom() && !stream->IsTemporarilyNonCustom();
}

template <class Key>
auto KFSp_GetHandles(KFS_Stream const* stream, Key* key, KFSp_Side side)
{
    using Number = std::conditional_t<std::is_const_v<Key>, double const, double>;
    bool const in = side == KFSp_Side::In;
    if (stream->IsSpatial()) {
        return in ? KFSp_Handles<Number>{&key->inSpeed, &key->inInfluence, 1}
                  : KFSp_Handles<Number>{&key->outSpeed, &key->outInfluence, 1};
    }
    if (!KFSp_HasHandleRuns(stream)) return KFSp_Handles<Number>{};
    KFSp_TemporalRuns<Number> const runs = KFSp_GetTemporalRuns(key, stream->GetDimension());
    return in ? KFSp_Handles<Number>{runs.inSpeed, runs.inInfluence, stream->GetDimension()}
              : KFSp_Handles<Number>{runs.outSpeed, runs.outInfluence, stream->GetDimension()};
}

// The elements that callers' arrays have.
inline int KFSp_HandleArraySize(KFS_Stream const* stream)
{
    return stream->IsSpatial() ? 1 : stream->GetDimension();
}

// One of a refusal's two sentences: the operation that failed and what it was about to do.
struct KFSp_Refusal {
    KFSp_Op operation;
    KFSp_Row action;
};

// Refuses a damaged stream, then one without a value or a key. Throws what making a render's copy throws.
[[nodiscard]] inline int KFSp_CheckHandleAccess(KFS_Stream const* stream, KFSp_Refusal const& damaged,
                                                KFSp_Refusal const& noKeys)
{
    if (int const code = KFSp_CheckStream(damaged.operation, stream, damaged.action)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    return KFSp_HasNoValue(data->stream, data) ? KFSp_ReportErr(noKeys.operation, KFS_Err_NoKeys, noKeys.action) : 0;
}

// The key at an index, or a constant's record whatever the index. -1 isn't the last key here: its neighbours would not
// be.
[[nodiscard]] inline int KFSp_GetHandleKey(KFS_Stream const* stream, KFS_StreamKeyData const* data, int index,
                                           KFS_KeyScalar** key)
{
    if (stream->HasNoKeys()) {
        *key = data->cache;
        return 0;
    }
    if (index < 0) return SEQ_Err_BadIndex;
    return KFSp_GetKey(data, index, key);
}

// The seconds to a key's neighbours, 0 where there is none.
struct KFSp_Durations {
    bool hasPrev = false;
    bool hasNext = false;
    double prev = 0.0;
    double next = 0.0;

    double operator[](KFSp_Side side) const { return side == KFSp_Side::In ? prev : next; }
};

[[nodiscard]] inline int KFSp_GetDurations(KFS_Stream const* stream, int index, KFS_KeyScalar const* key,
                                           KFSp_Durations* durations)
{
    if (stream->HasNoKeys()) return 0;
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    if (int const code = KFSp_GetNeighborsFromIndex(stream, index, 0, &prev, &next, nullptr, nullptr)) return code;
    durations->hasPrev = prev != nullptr;
    durations->hasNext = next != nullptr;
    if (prev) durations->prev = KFSp_Seconds(key->time, prev->time, stream->GetTimeScale());
    if (next) durations->next = KFSp_Seconds(next->time, key->time, stream->GetTimeScale());
    return 0;
}

// A side's handles as graph tangents: offsets from the key in seconds and in value. Components without a handle of their own
// have none.
class KFSp_SideTangent {
public:
    KFSp_SideTangent(KFS_Stream const* stream, KFS_KeyScalar const* key, KFSp_Side side,
                     KFSp_Durations const& durations)
        : handles_(KFSp_GetHandles(stream, key, side)),
          direction_(side == KFSp_Side::In ? -1.0 : 1.0),
          duration_(durations[side])
    {}

    double X(int i) const { return i < handles_.count ? direction_ * handles_.influence[i] * duration_ : 0.0; }
    double Y(int i) const { return i < handles_.count ? handles_.speed[i] * X(i) : 0.0; }

private:
    KFSp_Handles<double const> handles_;
    double direction_;
    double duration_;
};

// The slopes of the straight line from key to key, one for each component of a plain value.
inline void KFSp_FillSlopes(KFS_Stream const* stream, KFS_KeyScalar const* from, KFS_KeyScalar const* to,
                            double* slopes)
{
    double const duration = KFSp_Seconds(to->time, from->time, stream->GetTimeScale());
    for (int i = 0; i < stream->GetDimension(); ++i)
        slopes[i] = (KFSp_Numbers(to)[i] - KFSp_Numbers(from)[i]) / duration;
}

// The first speed of a side as getters answer it: as rest where it is all but that.
inline double KFSp_SettledSpeed(double speed)
{
    constexpr double least = 1e-10;
    return speed < least && speed > -least ? 0.0 : speed;
}

// The cache record as room for numbers of the key's own layout. What it held is gone, unless it is the key itself.
inline KFS_KeyScalar* KFSp_BorrowCache(KFS_StreamKeyData const* data, KFS_KeyScalar const* key)
{
    if (data->cache != key) data->cache->time = KFS_INVALID_INDEX;
    return data->cache;
}

// The end of every setter: the cached value may be of the curve as it was, and whoever listens is told once nothing
// failed.
[[nodiscard]] inline int KFSp_ForgetCachedValue(KFS_Stream* stream, KFSp_FirstError& error)
{
    if (stream->HasKeys()) error.Keep(KFSp_ClearCache(stream));
    return error.Code();
}
[[nodiscard]] inline int KFSp_TellOfHandleEdit(KFS_Stream* stream, int code)
{
    return code != 0 ? code : KFSp_Boundary([stream] { stream->NotifyValueChanged(); });
}
[[nodiscard]] inline int KFSp_FinishHandleEdit(KFS_Stream* stream, KFSp_FirstError& error)
{
    return KFSp_TellOfHandleEdit(stream, KFSp_ForgetCachedValue(stream, error));
}
