// Which key stands at or near a time.

#include "keystore/lookup.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "frame/statics_private.h"
#include "keystore/check_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/valuedata_private.h"

#include <utility>

namespace {

constexpr T_Time NoTime{KFS_INVALID_INDEX, 0};

template <class Value>
void Answer(Value* out, Value const& value)
{
    if (out) *out = value;
}

int GetKeyTime(KFS_Stream const* stream, KFS_StreamKeyData const* data, int index, T_Time* time)
{
    KFS_KeyScalar const* key = nullptr;
    int const code = KFSp_GetConstKey(data, index, &key);
    if (code == 0) *time = {key->time, stream->GetTimeScale()};
    return code;
}

// The index of the answer, which may lie beside the list.
int StepFromSearch(bool found, int index, short direction)
{
    bool const backward = (direction & KFS_Find_Backward) != 0;
    if (!found) return backward ? index - 1 : index;  // the search stopped at the next later key
    if (direction & KFS_Find_AtTime) return index;
    return backward ? index - 1 : index + 1;
}

int FindKeyTime(KFS_Stream const* stream, T_Time const* time, short direction, int* index, T_Time* keyTime)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_FindKeyTime, stream, KFSp_Row_GetKeyValue)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    if (stream->HasNoKeys()) return KFSp_ReportErr(KFSp_Op_FindKeyTime, KFS_Err_Constant, KFSp_Row_GetKeyValue);
    int const count = KFSp_ItemCount(data);
    if (count == 0) return 0;
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    bool found = false;
    int position = 0;
    if (int const code = KFSp_SearchKeys(data, at, &found, &position)) return code;
    int const answer = StepFromSearch(found, position, direction);
    if (answer < 0 || answer >= count) return 0;
    int const code = GetKeyTime(stream, data, answer, keyTime);
    if (code == 0) *index = answer;
    return code;
}

// Of the two keys around a time, or the one at the end of the list. `next` is the index of the first key after it.
int NearerKey(KFS_StreamKeyData const* data, int at, int next, int* nearest)
{
    if (next == 0 || next == KFSp_ItemCount(data)) {
        *nearest = next == 0 ? 0 : next - 1;
        return 0;
    }
    KFS_KeyScalar const* before = nullptr;
    KFS_KeyScalar const* after = nullptr;
    KFSp_FirstError error;
    error.Keep(KFSp_GetConstKey(data, next - 1, &before));
    error.Keep(KFSp_GetConstKey(data, next, &after));
    if (error.None()) {
        bool const isBefore = KFSp_TimeDifference(at, before->time) <= KFSp_TimeDifference(after->time, at);
        *nearest = isBefore ? next - 1 : next;
    }
    return error.Code();
}

int FindNearestKeyTime(KFS_Stream const* stream, T_Time const* time, int* index, T_Time* keyTime)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_FindNearestKeyTime, stream, KFSp_Row_InquireKey)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    T_Time const asked{at, stream->GetTimeScale()};
    if (stream->HasNoKeys()) {
        if (KFSp_HasNoValue(stream, data))
            return KFSp_ReportErr(KFSp_Op_FindNearestKeyTime, KFS_Err_NoKeys, KFSp_Row_GetValue);
        KFSp_MoveConstant(data, at);
        *index = 0;
        *keyTime = time ? *time : asked;
        return 0;
    }
    if (KFSp_ItemCount(data) == 0) {
        *keyTime = {KFS_INVALID_INDEX, stream->GetTimeScale()};
        return 0;
    }
    bool found = false;
    int position = 0;
    if (int const code = KFSp_SearchKeys(data, at, &found, &position)) return code;
    if (found) {
        *index = position;
        *keyTime = asked;
        return 0;
    }
    int nearest = 0;
    T_Time nearestTime = NoTime;
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        if (error.None()) error.Keep(NearerKey(data, at, position, &nearest));
        if (error.None()) error.Keep(GetKeyTime(stream, data, nearest, &nearestTime));
    }
    if (error.None()) {
        *index = nearest;
        *keyTime = nearestTime;
    }
    return error.Code();
}

// This thread is bringing a stream up to date for a look-up, until the scope ends. IsOutermost: it wasn't before.
class ScUpdating {
public:
    ScUpdating() : level_(ThisThreads()), saved_(std::exchange(level_, 1)) {}
    ~ScUpdating() { level_ = saved_; }
    ScUpdating(ScUpdating const&) = delete;
    ScUpdating& operator=(ScUpdating const&) = delete;

    bool IsOutermost() const { return saved_ == 0; }

private:
    static int& ThisThreads()
    {
        boost::thread_specific_ptr<int>& check = KFSp_GetTimeToIndexCheck();
        if (!check.get()) check.reset(new int(0));
        return *check;
    }

    int& level_;
    int saved_;
};

int UpdateForLookup(KFS_Stream const* stream)
{
    ScUpdating const updating;
    return updating.IsOutermost() ? stream->UpdateStream() : 0;
}

int TimeToIndex(KFS_Stream const* stream, T_Time const* time, int* index)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_TimeToIndex, stream, KFSp_Row_InquireKey)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    if (stream->HasNoKeys()) return KFSp_ReportErr(KFSp_Op_TimeToIndex, KFS_Err_Constant, KFSp_Row_InquireKey);
    if (KFSp_ItemCount(data) == 0) return KFSp_ReportErr(KFSp_Op_TimeToIndex, KFS_Err_NoKeys, KFSp_Row_InquireKey);
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    bool found = false;
    int position = 0;
    if (int const code = KFSp_SearchKeys(data, at, &found, &position)) return code;
    // An update asks for float keys that are in the way, and those are to be found where they stand.
    if (!found || !KFSp_FloatsAt(data, position)) {
        if (int const code = UpdateForLookup(stream)) {
            // The key that stands there is no less an answer.
            if (found) *index = position;
            return found ? 0 : code;
        }
        if (int const code = KFSp_SearchKeys(data, at, &found, &position)) return code;
    }
    if (found) *index = position;
    return 0;
}

int GetKeyIndex(KFS_Stream const* stream, T_Time const* time, int* index, bool* found)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetKeyIndex, stream, KFSp_Row_InquireKey)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    if (KFSp_HasNoValue(stream, data)) return KFSp_ReportErr(KFSp_Op_GetKeyIndex, KFS_Err_NoKeys, KFSp_Row_GetValue);
    if (stream->HasNoKeys()) {
        KFSp_MoveConstant(data, at);
        *index = 0;
        *found = true;
        return 0;
    }
    int position = 0;
    if (int const code = KFSp_SearchKeys(data, at, found, &position)) return code;
    if (*found)
        *index = position;
    else if (position > 0)
        *index = position - 1;
    return 0;
}

int IndexToTime(KFS_Stream const* stream, int index, T_Time* time)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_IndexToTime, stream, KFSp_Row_InquireKey)) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    if (stream->HasNoKeys()) {
        if (KFSp_HasNoValue(stream, data))
            return KFSp_ReportErr(KFSp_Op_IndexToTime, KFS_Err_Constant, KFSp_Row_InquireKey);
        *time = {data->cache->time, stream->GetTimeScale()};
        return 0;
    }
    int const count = KFSp_ItemCount(data);
    if (count == 0 || index < -1 || index >= count) return 0;
    T_Time answer = NoTime;
    KFSp_FirstError error;
    {
        KFSp_ScConstPin const pin(data->keys, error);
        KFS_KeyScalar const* key = nullptr;
        if (error.None()) error.Keep(KFSp_GetConstKey(data, index, &key));
        if (error.None()) error.Keep(stream->UpdateStreamIfFloatItem(key, index));
        if (error.None()) answer = {key->time, stream->GetTimeScale()};
    }
    if (error.None()) *time = answer;
    return error.Code();
}

}  // namespace

int KFS_FindKeyTime(KFS_Stream const* stream, T_Time const* time, short direction, unsigned char* found, int* index,
                    T_Time* keyTime)
{
    int foundIndex = KFS_INVALID_INDEX;
    T_Time foundTime = NoTime;
    int const code = KFSp_Boundary([&] { return FindKeyTime(stream, time, direction, &foundIndex, &foundTime); });
    Answer(found, static_cast<unsigned char>(foundIndex == KFS_INVALID_INDEX ? 0 : 1));
    Answer(index, foundIndex);
    Answer(keyTime, foundTime);
    return code;
}

int KFS_FindNearestKeyTime(KFS_Stream const* stream, T_Time const* time, int* index, T_Time* keyTime)
{
    int nearest = KFS_INVALID_INDEX;
    T_Time nearestTime = NoTime;
    int const code = KFSp_Boundary([&] { return FindNearestKeyTime(stream, time, &nearest, &nearestTime); });
    Answer(index, nearest);
    Answer(keyTime, nearestTime);
    return code;
}

int KFS_TimeToIndex(KFS_Stream const* stream, T_Time const* time, int* index)
{
    int at = KFS_INVALID_INDEX;
    int const code = KFSp_Boundary([&] { return TimeToIndex(stream, time, &at); });
    Answer(index, at);
    return code;
}

int KFS_GetKeyIndex(KFS_Stream const* stream, T_Time const* time, int* index, unsigned char* found)
{
    int atOrBefore = KFS_INVALID_INDEX;
    bool exactly = false;
    int const code = KFSp_Boundary([&] { return GetKeyIndex(stream, time, &atOrBefore, &exactly); });
    Answer(index, atOrBefore);
    Answer(found, static_cast<unsigned char>(exactly ? 1 : 0));
    return code;
}

int KFS_IndexToTime(KFS_Stream const* stream, int index, T_Time* time)
{
    *time = NoTime;
    return KFSp_Boundary([&] { return IndexToTime(stream, index, time); });
}
