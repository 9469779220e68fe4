// What a single key holds.

#include "keystore/check_private.h"
#include "keystore/lookup.h"

#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>

namespace {

// The key at the index, or the cache record that is a constant's only key, of what this thread sees of the stream.
int GetRecord(KFS_StreamKeyData const* data, int index, KFSp_Op operation, KFSp_Row action,
              KFS_KeyScalar const** record)
{
    if (KFSp_HasNoValue(data->stream, data)) return KFSp_ReportErr(operation, KFS_Err_NoKeys, action);
    if (data->stream->HasNoKeys()) {
        *record = data->cache;
        return 0;
    }
    return KFSp_GetConstKey(data, index, record);
}

void AnswerCodes(char* inInterp, char* outInterp, char in, char out)
{
    if (inInterp) *inInterp = in;
    if (outInterp) *outInterp = out;
}

// The record with its codes answered, for the two forms of the question.
int GetRecordAndCodes(KFS_StreamKeyData const* data, int index, char* inInterp, char* outInterp,
                      KFS_KeyScalar const** record)
{
    int const code = GetRecord(data, index, KFSp_Op_GetKey, KFSp_Row_GetValue, record);
    if (code == 0) AnswerCodes(inInterp, outInterp, (*record)->inInterp, (*record)->outInterp);
    return code;
}

}  // namespace

int KFS_GetKeyFlags(KFS_Stream const* stream, int index, unsigned short* flags)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_KeyFlags, stream, KFSp_Row_InquireKey)) return code;
        KFS_KeyScalar const* record = nullptr;
        int const code = GetRecord(stream->GetKeyData(), index, KFSp_Op_KeyFlags, KFSp_Row_InquireKey, &record);
        if (code == 0) *flags = record->flags;
        return code;
    });
}

int KFS_GetKey(KFS_Stream const* stream, int index, void* value, char* inInterp, char* outInterp)
{
    AnswerCodes(inInterp, outInterp, KFS_Interp_None, KFS_Interp_None);
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_GetKey, stream, KFSp_Row_GetValue)) return code;
        KFS_KeyScalar const* record = nullptr;
        KFS_StreamKeyData const* const data = stream->GetKeyData();
        int const code = GetRecordAndCodes(data, index, inInterp, outInterp, &record);
        if (code != 0 || !value) return code;
        KFS_Stream const* const seen = data->stream;
        short const kind = seen->HasNoKeys() ? KFS_Item_CacheValue : KFS_Item_KeyValue;
        KFS_CopyItemFunc const copy = KFSp_OutwardFunc(seen);
        return copy(KFSp_HandedTo(copy, seen), seen->GetItemRefcon(), kind, KFSp_ValueData(record), value);
    });
}

int KFS_GetKeyF(KFS_Stream const* stream, int index, double* value, char* inInterp, char* outInterp)
{
    AnswerCodes(inInterp, outInterp, KFS_Interp_None, KFS_Interp_None);
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_GetKey, stream, KFSp_Row_GetValue)) return code;
        KFS_StreamKeyData const* const data = stream->GetKeyData();
        if (value && data->stream->IsCustom())
            return KFSp_RefuseCustomValue(KFSp_Op_GetFloat, KFSp_Row_ComputeFloatValues);
        KFS_KeyScalar const* record = nullptr;
        int const code = GetRecordAndCodes(data, index, inInterp, outInterp, &record);
        if (code == 0 && value) std::copy_n(KFSp_Numbers(record), data->stream->GetDimension(), value);
        return code;
    });
}
