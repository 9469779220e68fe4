// Moving a key in time: float keys make way, the key leaves the list and comes back. Their true times are floatkeys.cpp's.
#include "curves/arcs_private.h"
#include "curves/floatkeys.h"
#include "curves/neighbours_private.h"
#include "curves/segment_private.h"
#include "curves/tangents.h"
#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/edit_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"

#include <algorithm>
#include <utility>
#include <vector>

namespace {

struct Move {
    KFS_Stream* stream;
    KFS_StreamKeyData* data;
    int index;
    int target;
    int old = KFS_INVALID_INDEX;
    int newIndex = KFS_INVALID_INDEX;
    // The keys that a move touches, by their indices before it.
    int low = 0;
    int high = 0;
};

int ResetEndInfluence(KFS_Stream* stream, int index)
{
    // As many numbers as the stream reads, and never fewer than a vector has.
    std::vector<double> const sixths(static_cast<std::size_t>(std::max<int>(stream->GetDimension(), 4)), KFSp_OneSixth);
    if (index == 0) {
        if (int const code = KFS_SetKeyInfluence(stream, 0, sixths.data(), nullptr); code != 0) return code;
    }
    if (index == stream->GetKeyCount() - 1) return KFS_SetKeyInfluence(stream, index, nullptr, sixths.data());
    return 0;
}

// Gives the float keys `first` to `last` the times that `placeHolder` says, which keep the order of the list.
template <class PlaceHolder>
int Pack(Move const& move, int first, int last, PlaceHolder&& placeHolder)
{
    if (!move.stream->IsSpatial()) return 0;  // the flag means nothing there
    for (int i = first; i <= last; ++i) {
        KFS_KeyScalar* key = nullptr;
        if (int const code = KFSp_GetKey(move.data, i, &key); code != 0) return code;
        if (KFSp_Floats(key)) KFSp_RetimeKey(move.data, i, key, placeHolder(i));
    }
    return 0;
}

// Packs the float keys from `first` to `last`, which lie on the same side of the anchor at `anchorIndex`, so that they
// stand one unit of time apart right behind it or right ahead of it.
int PackAt(Move const& move, KFS_KeyScalar const* anchor, int anchorIndex, int first, int last)
{
    return Pack(
        move, first, last, [&](int i) { return KFSp_TimeDifference(anchor->time, anchorIndex - i); });
}

// A key between two others counts as inside whatever its target is.
bool IsInside(Move const& move, KFSp_Neighbours const& around)
{
    return (around.prev && move.target > around.prev->time) || (around.next && move.target < around.next->time);
}

// Packs the float keys between the anchors around the key, so that it can go to any unit of time in between.
int MakeRoomInside(Move const& move, KFSp_Neighbours const& around)
{
    if (around.prev) {
        if (int const code = PackAt(move, around.prev, around.prevIndex, around.prevIndex + 1, move.index - 1);
            code != 0)
            return code;
    }
    return around.next ? PackAt(move, around.next, around.nextIndex, move.index + 1, around.nextIndex - 1) : 0;
}

// The same between the anchors around the target, for an end key that passes its only neighbour. The float keys stay on
// the side to which the key doesn't come. An anchor that stands at the target is about to be replaced, and until then
// float keys on both sides of it stay there.
int PackAroundTarget(Move const& move, KFSp_Neighbours const& around, int present)
{
    bool const behind = move.target <= present;
    auto const packBetween = [&](KFS_KeyScalar const* prev, int prevIndex, KFS_KeyScalar const* next, int nextIndex) {
        return behind ? PackAt(move, prev, prevIndex, prevIndex + 1, nextIndex - 1)
                      : PackAt(move, next, nextIndex, prevIndex + 1, nextIndex - 1);
    };
    if (!around.at || KFSp_Floats(around.at))
        return packBetween(around.prev, around.prevIndex, around.next, around.nextIndex);
    int const code = packBetween(around.prev, around.prevIndex, around.at, around.atIndex);
    return code != 0 ? code : packBetween(around.at, around.atIndex, around.next, around.nextIndex);
}

int MakeRoomOutside(Move* move, int present)
{
    KFSp_Neighbours around;
    if (int const code = KFSp_FindAround(move->stream, move->target, 0, &around); code != 0) return code;
    if (around.Both()) {
        if (int const code = PackAroundTarget(*move, around, present); code != 0) return code;
    }
    if (around.prev) move->low = std::min(move->low, around.prevIndex);
    if (around.next) move->high = std::max(move->high, around.nextIndex);
    return 0;
}

int MakeRoom(Move* move)
{
    KFSp_Neighbours around;
    if (int const code = KFSp_FindAroundKey(move->stream, move->index, 0, &around); code != 0) return code;
    move->low = around.prev ? around.prevIndex : move->index;
    move->high = around.next ? around.nextIndex : move->index;
    KFS_KeyScalar* key = nullptr;
    if (move->index < 0) return SEQ_Err_BadIndex;  // -1 would name the last key
    if (int const code = KFSp_GetKey(move->data, move->index, &key); code != 0) return code;
    int const code = IsInside(*move, around) ? MakeRoomInside(*move, around) : MakeRoomOutside(move, key->time);
    move->old = key->time;
    return code;
}

int Notify(KFS_Stream* stream)
{
    return KFSp_Boundary([stream] { stream->NotifyValueChanged(); });
}

// Takes the key out into the cache record and puts it back at its new time. Removal and insertion are changes of their
// own to whoever listens. But a listener that reads writes the cache record, in which the key stands in between, so
// both are told once it is back.
int Reinsert(Move* move)
{
    int const removed = KFSp_TakeKeyOut(move->stream, move->index, true);
    KFS_KeyScalar* const cache = move->data->cache;
    // What the record holds after a failure is the key only if the list has given it up.
    if (!KFSp_CacheIsEmpty(cache)) cache->time = move->target;
    if (removed != 0) return removed;
    KFSp_FirstError error;
    error.Keep(KFSp_PutKeyFromCache(move->stream,
                                    {.overwrite = true, .valueGiven = true, .tangentsGiven = true, .clearCache = true},
                                    &move->newIndex));
    bool const inserted = error.None();
    error.Keep(Notify(move->stream));
    if (inserted && error.None()) error.Keep(Notify(move->stream));
    return error.Code();
}

int MoveInList(Move* move)
{
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(move->data->keys, error);
        if (error.None()) error.Keep(MakeRoom(move));
    }
    if (!error.None()) return error.Code();

    bool const moves = move->old != move->target;
    if (moves)
        error.Keep(Reinsert(move));
    else
        move->newIndex = move->index;
    auto const count = static_cast<short>(move->high - move->low + 2);
    error.Keep(move->stream->SetInvalid(move->high + 1, count));
    error.Keep(move->stream->SetArcInvalid(move->high + 1, count));
    if (error.None()) error.Keep(KFSp_ClearCache(move->stream));
    return error.Code();
}

int SetKeyTime(Move* move)
{
    if (int const code = ResetEndInfluence(move->stream, move->index); code != 0) return code;
    if (move->stream->HasNoKeys()) {
        move->old = std::exchange(move->data->cache->time, move->target);
        return 0;
    }
    return MoveInList(move);
}

}  // namespace

int KFS_SetKeyTime(KFS_Stream* stream, int index, T_Time const* newTime, int newTimeValue, int* newIndex,
                   T_Time* oldTime)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_SetKeyTime, stream, KFSp_Row_AlterKey); code != 0) return code;
        KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
        if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_SetKeyTime, KFS_Err_NoKeys, KFSp_Row_AlterKey);
        Move move{stream, data, index, newTimeValue};
        if (newTime) {
            if (int const code = KFSp_TimeInStream(stream, newTime, &move.target); code != 0) return code;
        }
        if (move.target == KFS_INVALID_INDEX)  // as a record's time it says that there is no value
            return KFSp_ReportErr(KFSp_Op_SetKeyTime, KFS_Err_TimeNotRepresentable, KFSp_Row_AlterKey);
        int const code = SetKeyTime(&move);
        if (oldTime) *oldTime = T_Time{move.old, stream->GetTimeScale()};
        if (newIndex) *newIndex = move.newIndex;
        if (code == 0) stream->NotifyValueChanged();
        return code;
    });
}
