// All key times in a new scale, and what becomes of keys that meet.

#include "keystore/attributes.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/timehelpers.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/edit.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"

namespace {

// How far a key was from the tick that it has come to: |old - tick|.
int Distance(int old, unsigned int oldScale, T_Time const& tick, T_Time* distance)
{
    T_Time const before{old, oldScale};
    int const code = KFS_SubTime(&before, &tick, 0, distance);
    if (code == 0 && distance->value < 0) distance->value = -distance->value;
    return code;
}

// Of two keys that meet on a tick, whether the earlier one stays: unless the later one was nearer.
int EarlierStays(int earlier, int later, unsigned int oldScale, T_Time const& tick, bool* stays)
{
    T_Time fromEarlier{};
    T_Time fromLater{};
    int order = 0;
    KFSp_FirstError error;
    error.Keep(Distance(earlier, oldScale, tick, &fromEarlier));
    error.Keep(Distance(later, oldScale, tick, &fromLater));
    if (error.None()) error.Keep(T_CompareTime(&fromEarlier, &fromLater, &order));
    *stays = order <= 0;
    return error.Code();
}

int RetimeKeys(KFS_Stream* stream, KFS_StreamKeyData* data, unsigned int newScale)
{
    unsigned int const oldScale = stream->GetTimeScale();
    int previousOld = KFS_INVALID_INDEX;
    int previousNew = KFS_INVALID_INDEX;
    for (int index = 0; index < KFSp_ItemCount(data);) {
        KFS_KeyScalar* key = nullptr;
        if (int const code = KFSp_GetKey(data, index, &key)) return code;
        int const oldTime = key->time;
        T_Time tick{0, newScale};
        if (int const code = T_ShortConvTime(oldTime, oldScale, newScale, &tick.value)) return code;
        KFSp_RetimeKey(data, index, key, tick.value);
        if (index > 0 && tick.value == previousNew) {
            bool earlierStays = true;
            if (int const code = EarlierStays(previousOld, oldTime, oldScale, tick, &earlierStays)) return code;
            if (int const code = KFS_RemoveKey(stream, earlierStays ? index : index - 1, nullptr)) return code;
        } else {
            ++index;
        }
        // Whichever of two has gone. A third key on the tick then meets the later time; since of three times in a row
        // the middle one is never the farthest from a tick, the nearest of all is left in the end.
        previousOld = oldTime;
        previousNew = tick.value;
    }
    return 0;
}

// While some times are in the old scale and some in the new, no speed can be worked out of them. Listeners that are
// told of a removal may read.
class ScNoUpdates {
public:
    explicit ScNoUpdates(KFS_Stream* stream) : stream_(stream) { stream_->SetDisabledUpdateStream(true); }
    ~ScNoUpdates() { stream_->SetDisabledUpdateStream(false); }
    ScNoUpdates(ScNoUpdates const&) = delete;
    ScNoUpdates& operator=(ScNoUpdates const&) = delete;

private:
    KFS_Stream* stream_;
};

int RescaleKeys(KFS_Stream* stream, unsigned int newScale)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    if (int const code = KFSp_ClearCache(stream)) return code;
    KFSp_FirstError error;
    {
        KFSp_ScPin const pin(data->keys, error);
        if (error.None()) {
            ScNoUpdates const noUpdates(stream);
            error.Keep(RetimeKeys(stream, data, newScale));
        }
    }
    error.Keep(KFSp_ClearCache(stream));  // of what was read meanwhile
    if (error.None()) error.Keep(SEQ_Compact(data->keys));
    return error.Code();
}

}  // namespace

int KFS_RescaleStream(KFS_Stream* stream, unsigned int newScale)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_Rescale, stream, KFSp_Row_Rescale)) return code;
        if (newScale == stream->GetTimeScale()) return 0;
        if (stream->HasKeys() && KFSp_ItemCount(stream->GetKeyData()) > 0) {
            if (int const code = RescaleKeys(stream, newScale)) return code;
        }
        stream->SetTimeScale(newScale);
        stream->ShowChangeInCopy();
        return 0;
    });
}
