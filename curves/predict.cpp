// How far in time an edit would reach, told before it happens.
#include "curves/neighbours_private.h"
#include "curves/update.h"
#include "frame/report_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/renderstates_private.h"

#include <iterator>

namespace {

// The actions by what they touch: a side's spatial form reaches as far as its temporal one.
enum class Reach { Nowhere, Key, InSide, OutSide };

Reach GetReach(unsigned short action)
{
    constexpr Reach reaches[] = {Reach::Nowhere, Reach::Key,    Reach::Key,    Reach::InSide,
                                 Reach::OutSide, Reach::InSide, Reach::OutSide};
    return action < std::size(reaches) ? reaches[action] : Reach::Nowhere;
}

bool IsSpatialAction(unsigned short action)
{
    return action == 5 || action == 6;
}

struct Span {
    int from;
    int to;
};

// Whether a neighbour derives its handles on the far side from its own neighbours, so that an edit next to it reaches
// beyond it.
bool IsAutomatic(KFS_Stream const* stream, KFS_KeyScalar const* key, signed char farInterp)
{
    if (farInterp == KFS_Interp_Spline && (key->flags & KFS_KeyFlag_Modifiable) != 0) return true;
    return stream->IsSpatial() && KFSp_HasSpatialBlock(key) && (key->spFlags & KFS_KeySpFlag_Modifiable) != 0;
}

bool IsContinuous(KFS_Stream const* stream, KFS_KeyScalar const* key)
{
    if (!stream->IsSpatial()) return (key->flags & KFS_KeyFlag_Continuous) != 0;
    return KFSp_HasSpatialBlock(key) && (key->spFlags & KFS_KeySpFlag_Continuous) != 0;
}

// The path runs through float keys, so on a spatial stream they count as neighbours of an automatic key.
int NeighboursOf(KFS_Stream const* stream, int index, KFS_KeyScalar** prev, KFS_KeyScalar** next)
{
    return KFSp_GetNeighborsFromIndex(stream, index, stream->IsSpatial() ? 1 : 0, prev, next, nullptr, nullptr);
}

int ReachOfKey(KFS_Stream const* stream, KFSp_Neighbours const& around, Span* span)
{
    KFSp_FirstError error;
    KFS_KeyScalar* before = nullptr;
    KFS_KeyScalar* behind = nullptr;
    if (around.prev) {
        span->from = around.prev->time;
        if (IsAutomatic(stream, around.prev, around.prev->inInterp)) {
            error.Keep(NeighboursOf(stream, around.prevIndex, &before, &behind));
            if (before) span->from = before->time;
        }
    }
    if (around.next) {
        span->to = around.next->time;
        if (IsAutomatic(stream, around.next, around.next->outInterp)) {
            error.Keep(NeighboursOf(stream, around.nextIndex, &before, &behind));
            if (behind) span->to = behind->time;
        }
    }
    return error.Code();
}

int ReachOfSide(KFS_Stream const* stream, KFSp_Neighbours const& around, Reach reach, Span* span)
{
    if (!around.at) return KFSp_ReportRow(KFSp_Op_PredictInvalid, KFS_Err_NoControlPoint, KFSp_Row_NoControlPoint);
    bool const bothSides = IsContinuous(stream, around.at);
    if (around.prev && (reach == Reach::InSide || bothSides)) span->from = around.prev->time;
    if (around.next && (reach == Reach::OutSide || bothSides)) span->to = around.next->time;
    return 0;
}

int FindReach(KFS_Stream const* stream, Reach reach, int time, Span* span)
{
    KFSp_Neighbours around;
    if (int const code = KFSp_FindAround(stream, time, 0, &around); code != 0) return code;
    switch (reach) {
    case Reach::Key: return ReachOfKey(stream, around, span);
    case Reach::InSide:
    case Reach::OutSide: return ReachOfSide(stream, around, reach, span);
    case Reach::Nowhere: break;
    }
    return 0;
}

int Predict(KFS_Stream const* stream, unsigned short action, T_Time const* time, T_Time* from, T_Time* to)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_PredictInvalid, stream, KFSp_Row_PredictInvalid); code != 0)
        return code;
    stream = KFSp_Seen(stream);

    unsigned int const timeScale = stream->GetTimeScale();
    T_Time converted{time ? time->value : 0, timeScale};
    int const conversion = time ? T_ConvTime(time, timeScale, &converted, 0) : 0;
    if (IsSpatialAction(action) && !stream->IsSpatial())
        return KFSp_ReportErr(KFSp_Op_PredictInvalid, KFS_Err_NotSpatial, KFSp_Row_PredictInvalid);
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (stream->HasNoKeys() || KFSp_ItemCount(data) == 0) {
        *from = *to = T_Time{converted.value, timeScale};
        return conversion;
    }
    // Times of float keys are derived.
    if (stream->IsSpatial()) {
        if (int const code = stream->UpdateStream(); code != 0) return code;
    }

    KFSp_FirstError error;
    Span span{converted.value, converted.value};
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (error.None()) error.Keep(FindReach(stream, GetReach(action), converted.value, &span));
    }
    if (error.None()) {
        *from = T_Time{span.from, timeScale};
        *to = T_Time{span.to, timeScale};
    }
    return error.Code();
}

}  // namespace

int KFS_PredictInvalid(KFS_Stream const* stream, unsigned short action, T_Time const* time, T_Time* from, T_Time* to)
{
    return KFSp_Boundary([&] { return Predict(stream, action, time, from, to); });
}
