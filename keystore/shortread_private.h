#pragma once

#include "keystore/curvehooks_private.h"
#include "keystore/evaluate.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"

#include <cstring>

// The middle of nearly every read without a detour: a plain stream with keys that stand as they are. It leaves behind
// what KFSp_UpdateCacheToTime does, to the last byte of the cache record, which is what it is held against; whatever
// might want a function of the client's, a repair or a report isn't short, and goes that way.

// KFSp_IsStale, at once: an index isn't negative, and the sentinel has no other bit.
[[gnu::always_inline]] inline bool KFSp_IsFresh(KFS_StreamKeyData const* data)
{
    static_assert(KFS_INVALID_INDEX == INT_MIN);
    return (data->invalidKeyIndex[0] & data->invalidKeyIndex[1] & data->arcInvalidKeyIndex[0] &
            data->arcInvalidKeyIndex[1]) == KFS_INVALID_INDEX;
}

// Whether the value data is doubles, of a stream that interpolates by itself in time alone. `seen`: the stream as this
// thread's reads see it. These are asked each time: a caller may write a stream's flags and description at any time.
[[gnu::always_inline]] inline bool KFSp_IsPlain(KFS_Stream const* seen)
{
    return !seen->IsCustom() && !seen->IsSpatial() && seen->GetInterpFunc() == KFSp_Interpolate &&
           !seen->GetDisposeItemFunc();
}

// Whether KFSp_BringShort may be called for a stream that is plain: it has keys, their times are packed, none is stale, and
// copying one is copying its bytes.
[[gnu::always_inline]] inline bool KFSp_HasShortKeys(KFS_StreamKeyData const* data)
{
    if (!KFSp_HasShortcuts || !data->keys) return false;
    SEQ_Head const& head = **data->keys;
    return head.count > 0 && data->times.Mirrors(head.count) && !head.copy && KFSp_IsFresh(data);
}

// A key as it stands in the list into the cache record.
[[gnu::always_inline]] inline void KFSp_CopyKeyShort(SEQ_Head const& head, KFS_KeyScalar const* key,
                                                     KFS_KeyScalar* cache)
{
    constexpr int Usual = KFS_KeyHeadSize + 5 * static_cast<int>(sizeof(double));  // of one dimension
    if (head.itemSize == Usual) [[likely]]
        std::memcpy(static_cast<void*>(cache), key, Usual);
    else
        std::memcpy(static_cast<void*>(cache), key, static_cast<std::size_t>(head.itemSize));
    if (KFSp_HasSpatialBlock(cache)) [[unlikely]]
        cache->remapTable = nullptr;
}

// Brings the cache record to a time, for a read that wants the value and nothing else. Answers the interpolation's code.
[[nodiscard]] [[gnu::always_inline]] inline int KFSp_BringShort(KFS_Stream const* seen, KFS_StreamKeyData const* data,
                                                                int time)
{
    KFS_KeyScalar* const cache = data->cache;
    if (cache->time == time && time != KFS_INVALID_INDEX) return 0;
    SEQ_Head const& head = **data->keys;
    int const next = data->times.LowerBound(time);
    bool const isPast = next >= head.count;
    if (next == 0 || isPast || data->times[next] == time) {
        void const* const key = KFSp_GetItem(data->keys, isPast ? next - 1 : next);
        KFSp_CopyKeyShort(head, static_cast<KFS_KeyScalar const*>(key), cache);
        return 0;
    }
    auto const [a, b] = KFSp_GetKeyPair(data, next - 1);
    // A hold on the far side takes the later key's value, and is meant to.
    if (a->outInterp == KFS_Interp_Hold || b->inInterp == KFS_Interp_Hold) {
        KFSp_CopyKeyShort(head, a->outInterp == KFS_Interp_Hold ? a : b, cache);
        return 0;
    }
    cache->time = KFS_INVALID_INDEX;  // also where the interpolation throws
    int const code = KFSp_InterpolateBetween(seen, a, b, time, KFSp_Numbers(cache));
    if (code == 0) cache->time = time;
    return code;
}

// Whether a read with a value is one of the followers of a stream whose dimensions are separated.
inline bool KFSp_AnswersFromFollowers(KFS_Stream const* stream)
{
    return stream->GetParent() && !stream->IsCanonical() && stream->AreDimensionsSeparated();
}

// The same for who can't let it throw: true also where it does, so that it comes again in its place.
bool KFSp_MayAnswerFromFollowers(KFS_Stream const* stream) noexcept;

// A stream as a short read sees it: what is read, and the time in its scale.
struct KFSp_ShortRead {
    KFS_StreamKeyData const* data;
    KFS_Stream const* seen;
    int time;
};

// Whether a read with a time, a value and nothing else is one of a plain stream on which nothing but its key data has a
// say, in a render whose state has promised to ask for nothing else. KFSp_BringShort tells whether that is in order.
// `context`: the thread's, or null.
[[gnu::always_inline]] inline bool KFSp_IsShortRead(KFS_Stream const* stream, Q_RenderContext const* context,
                                                    T_Time const* time, int flags, KFSp_ShortRead* read)
{
    if (stream->GetStamp() != KFS_StreamValidStamp || !context) return false;
    KFSp_RenderStates const& states = KFSp_GetRenderStates(context);
    if (!states.plainKeyReads) return false;
    KFS_StreamKeyData const* const data = KFSp_KeyDataDoor::Find(stream, context, states);
    if (!data) return false;
    KFS_Stream const* const seen = data->stream;
    if (!KFSp_IsPlain(seen) || seen->GetDimension() < 1) return false;
    if (seen->HasExpression() && (flags & KFS_EvalFlag_NoExpression) == 0) return false;
    if (stream->GetParent() && KFSp_MayAnswerFromFollowers(stream)) return false;
    read->data = data;
    read->seen = seen;
    return T_ShortConvTime(time->value, time->scale, seen->GetTimeScale(), &read->time) == 0;
}

// Brings the cache record to the time of such a read. False, and nothing done, where the key data isn't in order for it;
// else `code` is the interpolation's.
[[nodiscard]] [[gnu::always_inline]] inline bool KFSp_BringShort(KFSp_ShortRead const& read, int* code)
{
    *code = 0;
    if (read.seen->HasNoKeys()) {
        if (KFSp_CacheIsEmpty(read.data->cache)) return false;
        KFSp_MoveConstant(read.data, read.time);
        return true;
    }
    if (!KFSp_HasShortKeys(read.data)) return false;
    *code = KFSp_BringShort(read.seen, read.data, read.time);
    return true;
}

// What nearly all streams are read for: a few doubles, without a call for some bytes. False where there are more.
[[gnu::always_inline]] inline bool KFSp_CopyFewDoubles(int count, void const* from, double* to)
{
    switch (count) {
    case 1: std::memcpy(to, from, sizeof *to); return true;
    case 2: std::memcpy(to, from, 2 * sizeof *to); return true;
    case 3: std::memcpy(to, from, 3 * sizeof *to); return true;
    case 4: std::memcpy(to, from, 4 * sizeof *to); return true;
    default: return false;
    }
}

// From the cache record to the caller, within the stream's limits. `seen`: the stream as this thread sees it.
[[gnu::always_inline]] inline int KFSp_CopyDoublesOut(KFS_Stream const* stream, KFS_Stream const* seen,
                                                      void const* from, double* value)
{
    if (!stream->IsFloatBased() && KFSp_CopyFewDoubles(seen->GetDimension(), from, value)) return 0;
    return KFSp_FakeCopyItemFunc(seen, 0, KFS_Item_CacheValue, from, value);
}

// The same as the end of a short read, which may ask the stream's class. Apart, so that what comes before needs no way
// out for a throw.
[[nodiscard]] int KFSp_EndDoubles(KFS_Stream const* stream, KFS_Stream const* seen, void const* from, double* value);
