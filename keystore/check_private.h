#pragma once

#include "frame/report_private.h"
#include "keystore/stream.h"

// How every operation on a leaf begins: 0 if the stream's validity stamp is right, else reports code 2 and returns it.
// Reads nothing of the stream but the stamp. `messageIndex`: the row that names the action.
[[nodiscard]] inline int KFSp_CheckStream(short operation, KFS_Stream const* stream, short messageIndex)
{
    if (stream->GetStamp() == KFS_StreamValidStamp) [[likely]]
        return 0;
    return KFSp_ReportErr(operation, KFS_Err_DamagedStream, messageIndex);
}
