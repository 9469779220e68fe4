// Walks over keys with a caller's function.

#include "keystore/check_private.h"
#include "keystore/keywalk_private.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/keylist_private.h"

namespace {

// Ready to walk: undamaged, with something to walk over, and up to date.
int PrepareWalk(KFS_Stream* stream, KFSp_Op operation)
{
    if (int const code = KFSp_CheckStream(operation, stream, KFSp_Row_IterateOver)) return code;
    if (stream->HasNoValue()) return KFSp_ReportErr(operation, KFS_Err_NoKeys, KFSp_Row_IterateOver);
    return stream->UpdateStream();
}

int WalkConstant(KFSp_KeyWalk* walk)
{
    return KFSp_InvokeItemFunc(nullptr, reinterpret_cast<long>(walk), KFS_INVALID_INDEX, walk->stream->GetCache());
}

int WalkList(KFSp_KeyWalk* walk, int first, int last, int* lastIndex)
{
    // Whoever is handed the records for writing may have written their times, so what mirrors them ends here (T1).
    struct ScDropTimes {
        KFS_StreamKeyData const* data;
        ~ScDropTimes() { data->times.Drop(); }
    } const drop{walk->stream->GetKeyData()};
    return SEQ_ForRange(drop.data->keys, first, last, reinterpret_cast<long>(walk), KFSp_InvokeItemFunc, lastIndex);
}

// An end of a range of times as an index, which may lie beside the list. `onTheLeft`: between two keys the earlier one
// is meant.
int FindEnd(KFS_Stream const* stream, T_Time const* time, bool onTheLeft, int* index)
{
    int at = 0;
    if (int const code = KFSp_TimeInStream(stream, time, &at)) return code;
    bool found = false;
    int const code = KFSp_SearchKeys(stream->GetKeyData(), at, &found, index);
    if (!found && onTheLeft) --*index;
    return code;
}

int WalkTimes(KFSp_KeyWalk* walk, T_Time const* first, T_Time const* last)
{
    KFS_Stream const* const stream = walk->stream;
    int order = 0;
    if (first && last) {
        if (int const code = T_CompareTime(first, last, &order)) return code;
    }
    bool const backward = order > 0;
    int firstIndex = 0;
    if (first) {
        if (int const code = FindEnd(stream, first, backward, &firstIndex)) return code;
    }
    int lastIndex = KFSp_ItemCount(stream->GetKeyData()) - 1;
    if (last) {
        if (int const code = FindEnd(stream, last, !backward, &lastIndex)) return code;
    }
    if (backward ? firstIndex < lastIndex : firstIndex > lastIndex) return 0;
    return WalkList(walk, firstIndex, lastIndex, nullptr);
}

}  // namespace

int KFSp_InvokeItemFunc(SEQ_Head**, long walk, int index, void* item)
{
    auto* const context = reinterpret_cast<KFSp_KeyWalk*>(walk);
    auto* const key = static_cast<KFS_KeyScalar*>(item);
    context->lastTime = key->time;
    return context->func(context->stream, context->refcon, index, key);
}

int KFS_ForRange(KFS_Stream* stream, T_Time const* first, T_Time const* last, long refcon, KFS_KeyFunc func,
                 T_Time* lastTime)
{
    if (lastTime) *lastTime = {KFS_INVALID_INDEX, 0};
    return KFSp_Boundary([&] {
        if (int const code = PrepareWalk(stream, KFSp_Op_ForRange)) return code;
        KFSp_KeyWalk walk{stream, refcon, func};
        int const code =
            KFSp_Boundary([&] { return stream->HasNoKeys() ? WalkConstant(&walk) : WalkTimes(&walk, first, last); });
        if (lastTime) *lastTime = {walk.lastTime, stream->GetTimeScale()};
        return code;
    });
}

int KFS_ForIndexRange(KFS_Stream* stream, int first, int last, long refcon, KFS_KeyFunc func, int* lastIndex)
{
    if (lastIndex) *lastIndex = KFS_INVALID_INDEX;
    return KFSp_Boundary([&] {
        if (int const code = PrepareWalk(stream, KFSp_Op_ForIndexRange)) return code;
        KFSp_KeyWalk walk{stream, refcon, func};
        if (stream->HasNoKeys()) {
            if (lastIndex) *lastIndex = 0;
            return WalkConstant(&walk);
        }
        return WalkList(&walk, first, last, lastIndex);
    });
}
