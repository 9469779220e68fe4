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

// Moving a key in time.

namespace {

// The keys around an index or a time; a missing one is null, and its index means nothing.
struct Neighbours {
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    int prevIndex = 0;
    int nextIndex = 0;
};

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

int GetKey(Move const& move, int index, KFS_KeyScalar** key)
{
    void* item = nullptr;
    int const code = SEQ_GetAddress(move.data->keys, index, 0, &item);
    *key = static_cast<KFS_KeyScalar*>(item);
    return code;
}

// Gives the float keys `first` to `last` the times that `placeHolder` says, which keep the order of the list.
template <class PlaceHolder>
int Pack(Move const& move, int first, int last, PlaceHolder&& placeHolder)
{
    for (int i = first; i <= last; ++i) {
        KFS_KeyScalar* key = nullptr;
        if (int const code = GetKey(move, i, &key); code != 0) return code;
        if (KFSp_Floats(key)) KFSp_RetimeKey(move.data, i, key, placeHolder(i));
    }
    return 0;
}

int PackBehind(Move const& move, Neighbours const& around, int last)
{
    return Pack(
        move, around.prevIndex + 1, last, [&](int i) { return around.prev->time + (i - around.prevIndex); });
}

int PackAheadOf(Move const& move, Neighbours const& around, int first)
{
    return Pack(
        move, first, around.nextIndex - 1, [&](int i) { return around.next->time - (around.nextIndex - i); });
}

// A key between two others counts as inside whatever its target is.
bool IsInside(Move const& move, Neighbours const& around)
{
    return (around.prev && move.target > around.prev->time) || (around.next && move.target < around.next->time);
}

// Packs the float keys between the anchors around the key, so that it can go to any unit of time in between.
int MakeRoomInside(Move const& move, Neighbours const& around)
{
    if (around.prev) {
        if (int const code = PackBehind(move, around, move.index - 1); code != 0) return code;
    }
    return around.next ? PackAheadOf(move, around, move.index + 1) : 0;
}

// The same between the anchors around the target, for an end key that passes its only neighbour. They stay on the side
// to which the key doesn't come.
int MakeRoomOutside(Move* move, int present)
{
    Neighbours around;
    KFS_KeyScalar* at = nullptr;
    if (int const code = KFSp_GetNeighborsFromTime(move->stream, move->target, 0, &at, &around.prev, &around.next,
                                                   &around.prevIndex, &around.nextIndex, nullptr);
        code != 0)
        return code;
    if (around.prev && around.next) {
        int const code = move->target <= present ? PackBehind(*move, around, around.nextIndex - 1)
                                                 : PackAheadOf(*move, around, around.prevIndex + 1);
        if (code != 0) return code;
    }
    if (around.prev) move->low = std::min(move->low, around.prevIndex);
    if (around.next) move->high = std::max(move->high, around.nextIndex);
    return 0;
}

int MakeRoom(Move* move)
{
    Neighbours around;
    if (int const code = KFSp_GetNeighborsFromIndex(move->stream, move->index, 0, &around.prev, &around.next,
                                                    &around.prevIndex, &around.nextIndex);
        code != 0)
        return code;
    move->low = around.prev ? around.prevIndex : move->index;
    move->high = around.next ? around.nextIndex : move->index;
    KFS_KeyScalar* key = nullptr;
    if (int const code = GetKey(*move, move->index, &key); code != 0) return code;
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
    error.Keep(KFSp_PutKeyFromCache(1, 1, 1, 1, move->stream, &move->newIndex));
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
