// Many keys at once, all of them or none.

#include "keystore/edit.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/check_private.h"
#include "keystore/curvehooks_private.h"
#include "keystore/edit_private.h"
#include "keystore/keylist_private.h"
#include "keystore/plainkeys_private.h"

#include <utility>

namespace {

// The key data as they were, which come back unless the edit is through. The edit works on the stream's own, where
// whoever it calls looks for them.
class ScUndo {
public:
    explicit ScUndo(KFS_StreamKeyData* data) : data_(data), before_(*data, data->stream) {}
    ~ScUndo()
    {
        if (!data_) return;
        std::swap(data_->keys, before_.keys);
        std::swap(data_->cache, before_.cache);
        std::swap(data_->invalidKeyIndex, before_.invalidKeyIndex);
        std::swap(data_->arcInvalidKeyIndex, before_.arcInvalidKeyIndex);
        data_->times.Drop();
    }
    ScUndo(ScUndo const&) = delete;
    ScUndo& operator=(ScUndo const&) = delete;

    void Keep() noexcept { data_ = nullptr; }

private:
    KFS_StreamKeyData* data_;
    KFS_StreamKeyData before_;
};

template <class T>
T const* At(T const* array, int index, int each)
{
    return array ? array + std::ptrdiff_t{index} * each : nullptr;
}

int SetHandles(KFS_Stream* stream, KFS_NewKeys const& keys, int i, T_Time const& time)
{
    int at = 0;
    bool found = false;
    int index = 0;
    if (int const code = KFSp_TimeInStream(stream, &time, &at)) return code;
    if (stream->HasKeys()) {
        if (int const code = KFSp_SearchKeys(stream->GetKeyData(), at, &found, &index)) return code;
    }
    int const each = stream->IsSpatial() ? 1 : stream->GetDimension();
    if (keys.inSpeeds || keys.outSpeeds) {
        if (int const code = KFSp_SetKeySpeeds(stream, index, At(keys.inSpeeds, i, each), At(keys.outSpeeds, i, each)))
            return code;
    }
    if (!keys.inInfluences && !keys.outInfluences) return 0;
    return KFSp_SetKeyInfluences(stream, index, At(keys.inInfluences, i, each), At(keys.outInfluences, i, each));
}

int InsertOneByOne(KFS_Stream* stream, KFS_NewKeys const& keys, bool replace)
{
    ScUndo undo(stream->GetKeyDataForModify());
    for (int i = 0; i < keys.count; ++i) {
        T_Time const time{keys.times[i], keys.timeScale};
        char const in = keys.inInterps ? keys.inInterps[i] : char{KFS_Interp_None};
        char const out = keys.outInterps ? keys.outInterps[i] : char{KFS_Interp_None};
        double const* const value = At(keys.values, i, stream->GetDimension());
        if (int const code = KFSp_InsertKeyF(stream, &time, replace, value, in, out)) return code;
        if (int const code = SetHandles(stream, keys, i, time)) return code;
    }
    undo.Keep();
    return 0;
}

}  // namespace

int KFS_InsertKeys(KFS_Stream* stream, KFS_NewKeys const* keys, unsigned char replace)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_InsertKeys, stream, KFSp_Row_InsertKey)) return code;
    if (keys->count <= 0) return 0;
    return KFSp_Boundary([&] {
        if (!KFSp_InsertPlainKeys(stream, *keys)) KFSp_ThrowIf(InsertOneByOne(stream, *keys, replace != 0));
        stream->NotifyValueChanged();
    });
}
