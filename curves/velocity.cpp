// Temporal handles as speeds, in the stream's own type and as doubles.
#include "curves/arcs_private.h"
#include "curves/keyhandles_private.h"
#include "curves/neighbours_private.h"
#include "curves/tangents.h"
#include "keystore/check_private.h"
#include "keystore/curvehooks_private.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/pins_private.h"
#include "keystore/savedrecords_private.h"

#include <algorithm>
#include <cmath>

namespace {

constexpr double NoDuration = 1e-12;
constexpr int NoDurationError = KFS_Err_LegacyMismatch;

// A key, a side of which is asked for.
struct AskedKey {
    KFS_Stream const* stream;
    KFS_StreamKeyData const* data;
    int index;
    int count;  // as KFSp_KeyCount answers
    KFS_KeyScalar* key = nullptr;
    KFS_KeyScalar* prev = nullptr;
    KFS_KeyScalar* next = nullptr;
    int prevIndex = 0;
    int nextIndex = 0;

    bool IsFirst() const { return index == 0; }
    bool IsLast() const { return index == count - 1; }
    bool IsEnd(KFSp_Side side) const { return side == KFSp_Side::In ? IsFirst() : IsLast(); }
    signed char Interp(KFSp_Side side) const { return side == KFSp_Side::In ? key->inInterp : key->outInterp; }

    // Neither side of a held segment moves.
    bool IsAtRest(KFSp_Side side) const
    {
        if (Interp(side) == KFS_Interp_Hold) return true;
        return side == KFSp_Side::In ? prev && prev->outInterp == KFS_Interp_Hold
                                     : next && next->inInterp == KFS_Interp_Hold;
    }
};

int FindKey(AskedKey* asked)
{
    if (int const code = KFSp_GetHandleKey(asked->stream, asked->data, asked->index, &asked->key)) return code;
    if (asked->stream->HasNoKeys()) return 0;
    return KFSp_GetNeighborsFromIndex(asked->stream, asked->index, 0, &asked->prev, &asked->next, &asked->prevIndex,
                                      &asked->nextIndex);
}

// The speed of a straight run between anchors: up to the key, from it on, or, for a float key, through it.
int GetRunSpeed(AskedKey const& asked, KFSp_Side side, double* speed)
{
    bool const through = KFSp_Floats(asked.key) && asked.prev && asked.next;
    bool const fromPrev = through || side == KFSp_Side::In;
    bool const toNext = through || side == KFSp_Side::Out;
    KFS_KeyScalar const* const from = fromPrev ? asked.prev : asked.key;
    KFS_KeyScalar const* const to = toNext ? asked.next : asked.key;
    double distance = 0.0;
    if (int const code = KFSp_SumArcs(asked.data, fromPrev ? asked.prevIndex : asked.index,
                                      toNext ? asked.nextIndex : asked.index, &distance))
        return code;
    double const duration = KFSp_Seconds(to->time, from->time, asked.stream->GetTimeScale());
    if (std::fabs(duration) < NoDuration) return NoDurationError;
    *speed = distance / duration;
    return 0;
}

int GetSpatialSpeed(AskedKey const& asked, KFSp_Side side, bool zeroAtEnds, double* speed, bool* answered)
{
    KFSp_Handles<double> const handles = KFSp_GetHandles(asked.stream, asked.key, side);
    signed char const interp = asked.Interp(side);
    *answered = true;
    if ((zeroAtEnds && asked.IsEnd(side)) || asked.IsAtRest(side)) {
        *speed = 0.0;
        return 0;
    }
    if (interp == KFS_Interp_Spline) {
        *speed = *handles.influence == 0.0 ? 0.0 : *handles.speed;
        return 0;
    }
    bool const hasRun =
        side == KFSp_Side::In ? asked.prev && asked.index > 0 : asked.next && asked.index < asked.count - 1;
    if (interp == KFS_Interp_Linear && hasRun) return GetRunSpeed(asked, side, speed);
    *answered = false;
    return 0;
}

// The slope to the key right beside, in the cache record's numbers of that side.
int ComputeSlopes(AskedKey const& asked, KFSp_Side side, double const** slopes)
{
    KFS_KeyScalar const* beside = nullptr;
    if (int const code =
            KFSp_GetConstKey(asked.data, side == KFSp_Side::In ? asked.index - 1 : asked.index + 1, &beside))
        return code;
    KFS_KeyScalar const* const from = side == KFSp_Side::In ? beside : asked.key;
    KFS_KeyScalar const* const to = side == KFSp_Side::In ? asked.key : beside;
    double* const scratch = KFSp_GetHandles(asked.stream, KFSp_BorrowCache(asked.data, asked.key), side).speed;
    KFSp_FillSlopes(asked.stream, from, to, scratch);
    *slopes = scratch;
    return 0;
}

int GetPlainSpeed(AskedKey const& asked, KFSp_Side side, double* speed, bool* answered)
{
    signed char const interp = asked.Interp(side);
    bool const constantLine = asked.stream->HasNoKeys() && interp == KFS_Interp_Linear;
    *answered = true;
    if (asked.IsEnd(side) || asked.IsAtRest(side) || constantLine || !KFSp_HasHandleRuns(asked.stream)) {
        std::fill_n(speed, KFSp_HandleArraySize(asked.stream), 0.0);
        return 0;
    }
    double const* source = nullptr;
    if (interp == KFS_Interp_Linear) {
        if (int const code = ComputeSlopes(asked, side, &source)) return code;
    } else if (interp == KFS_Interp_Spline) {
        source = KFSp_GetHandles(asked.stream, asked.key, side).speed;
    } else {
        *answered = false;
        return 0;
    }
    short const kind = asked.key == asked.data->cache ? KFS_Item_CacheValue : KFS_Item_KeyValue;
    return KFSp_FakeCopyItemFuncNoLimits(asked.stream, asked.stream->GetItemRefcon(), kind, source, speed);
}

int GetSpeed(AskedKey const& asked, KFSp_Side side, bool zeroAtEnds, double* speed)
{
    bool answered = false;
    int const code = asked.stream->IsSpatial() ? GetSpatialSpeed(asked, side, zeroAtEnds, speed, &answered)
                                               : GetPlainSpeed(asked, side, speed, &answered);
    bool const hasElement = KFSp_HandleArraySize(asked.stream) > 0;
    if (code == 0 && answered && hasElement) speed[0] = KFSp_SettledSpeed(speed[0]);
    return code;
}

int SetSpatialSpeeds(KFS_Stream* stream, int index, KFS_KeyScalar* key, double const* in, double const* out)
{
    bool const nonDecreasing = (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0;
    bool const continuous = (key->flags & KFS_KeyFlag_Continuous) != 0;
    auto const allowed = [nonDecreasing](double speed) { return nonDecreasing && speed < 0.0 ? 0.0 : speed; };
    if (in) key->inSpeed = allowed(*in);
    if (out) key->outSpeed = allowed(*out);
    if (continuous && in && !out) key->outSpeed = key->inSpeed;
    if (continuous && out && !in) key->inSpeed = key->outSpeed;
    KFSp_FirstError error;
    if (in || continuous) error.Keep(stream->SetInvalid(index, 1));
    if (out || continuous) error.Keep(stream->SetInvalid(index + 1, 1));
    return error.Code();
}

// The library's own copies move a whole custom value, and a custom record has no room for a second one behind the
// first. A client's function knows its record.
bool CanStoreSpeeds(KFS_Stream const* stream)
{
    if (KFSp_HasHandleRuns(stream)) return true;
    KFS_CopyItemFunc const copy = stream->GetCopyItemFunc();
    return !stream->IsTemporarilyNonCustom() && copy != &KFSp_FakeCopyItemFunc &&
           copy != &KFSp_FakeCopyItemFuncNoLimits;
}

int SetPlainSpeeds(KFS_Stream* stream, KFS_KeyScalar* key, void const* in, void const* out, KFS_CopyItemFunc own)
{
    if (!CanStoreSpeeds(stream)) return 0;
    KFS_CopyItemFunc const copy = own ? own : &KFSp_ConvertItemToFloat;
    bool const continuous = (key->flags & KFS_KeyFlag_Continuous) != 0;
    void const* const inSource = in || !continuous ? in : out;
    void const* const outSource = out || !continuous ? out : in;
    KFSp_TemporalRuns<double> const runs = KFSp_GetTemporalRuns(key, stream->GetDimension());
    KFSp_FirstError error;
    if (inSource) error.Keep(copy(stream, stream->GetItemRefcon(), KFS_Item_KeyValue, inSource, runs.inSpeed));
    if (outSource && error.None())
        error.Keep(copy(stream, stream->GetItemRefcon(), KFS_Item_KeyValue, outSource, runs.outSpeed));
    return error.Code();
}

int SetSpeeds(KFS_Stream* stream, int index, void const* in, void const* out, KFS_CopyItemFunc copy)
{
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(stream->GetKeys(), index, error);
        if (error.None()) {
            error.Keep(stream->IsSpatial() ? SetSpatialSpeeds(stream, index, key.get(), static_cast<double const*>(in),
                                                              static_cast<double const*>(out))
                                           : SetPlainSpeeds(stream, key.get(), in, out, copy));
        }
        if (error.None()) key->flags &= static_cast<unsigned short>(~KFS_KeyFlag_Modifiable);
    }
    return error.Code();
}

int CheckVelocityAccess(KFS_Stream const* stream)
{
    return KFSp_CheckHandleAccess(stream, {KFSp_Op_SetKeyVelocity, KFSp_Row_AlterKey},
                                  {KFSp_Op_SetKeyVelocity, KFSp_Row_InquireKey});
}

int SetVelocity(KFS_Stream* stream, int index, void const* in, void const* out)
{
    return stream->HasNoKeys() ? 0 : SetSpeeds(stream, index, in, out, stream->GetCopyItemFunc());
}

int GetVelocity(KFS_Stream const* stream, int index, bool zeroAtEnds, double* inVelocity, double* outVelocity)
{
    KFSp_Refusal const refusal{KFSp_Op_GetKeyVelocity, KFSp_Row_GetValue};
    if (int const code = KFSp_CheckHandleAccess(stream, refusal, refusal)) return code;
    stream = KFSp_Seen(stream);
    // Speeds of straight runs come from arcs. What can't be repaired is answered as it stands.
    (void)(stream->IsSpatial() ? stream->UpdateStream() : stream->UpdateStreamIfStaleTangents(index));
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    AskedKey asked{stream, data, index, KFSp_KeyCount(stream, data)};
    if (int const code = FindKey(&asked)) return code;
    if (inVelocity) {
        if (int const code = GetSpeed(asked, KFSp_Side::In, zeroAtEnds, inVelocity)) return code;
    }
    return outVelocity ? GetSpeed(asked, KFSp_Side::Out, zeroAtEnds, outVelocity) : 0;
}

}  // namespace

int KFS_SetKeyVelocity(KFS_Stream* stream, int index, void const* inVelocity, void const* outVelocity)
{
    return KFSp_Boundary([&] {
        if (int const code = CheckVelocityAccess(stream)) return code;
        KFSp_FirstError error;
        error.Keep(SetVelocity(stream, index, inVelocity, outVelocity));
        return KFSp_FinishHandleEdit(stream, error);
    });
}

// Listeners hear of it when the stream is itself again, so they aren't told in here.
int KFSp_SetKeySpeeds(KFS_Stream* stream, int index, double const* in, double const* out)
{
    return KFSp_Boundary([&] {
        if (int const code = CheckVelocityAccess(stream)) return code;
        KFSp_FirstError error;
        // A cached custom value must be disposed while the stream still says what it is.
        if (stream->HasKeys()) error.Keep(KFSp_ClearCache(stream));
        if (stream->HasKeys() && KFSp_HasHandleRuns(stream)) {  // doubles already
            error.Keep(SetSpeeds(stream, index, in, out, KFSp_FakeCopyItemFuncNoLimits));
        } else {
            KFSp_ScDoubleValues doubles(stream, KFSp_FakeCopyItemFuncNoLimits);
            error.Keep(doubles.Code());
            if (error.None()) error.Keep(SetVelocity(stream, index, in, out));
            error.Keep(doubles.Restore());
        }
        return KFSp_ForgetCachedValue(stream, error);
    });
}

int KFS_SetKeyVelocityF(KFS_Stream* stream, int index, double const* inVelocity, double const* outVelocity)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetKeyVelocityF, stream, KFSp_Row_AlterKey)) return code;
    return KFSp_TellOfHandleEdit(stream, KFSp_SetKeySpeeds(stream, index, inVelocity, outVelocity));
}

int KFS_GetKeyVelocityF(KFS_Stream const* stream, int index, unsigned char zeroAtEnds, double* inVelocity,
                        double* outVelocity)
{
    return KFSp_Boundary([&] { return GetVelocity(stream, index, zeroAtEnds != 0, inVelocity, outVelocity); });
}

int KFSp_EqualizeSides(KFS_Stream* stream, int index)
{
    KFSp_ScBytes const bytes(static_cast<std::size_t>(std::max<int>(stream->GetDimension(), 1)) * sizeof(double));
    auto* const velocity = static_cast<double*>(bytes.get());
    if (!velocity) return KFS_Err_OutOfMemory;
    if (int const code = KFS_GetKeyVelocityF(stream, index, 0, velocity, nullptr)) return code;
    return KFS_SetKeyVelocityF(stream, index, nullptr, velocity);
}
