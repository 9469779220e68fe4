#include "frame/services/chunkfile.h"

#include <algorithm>
#include <tuple>
#include <utility>

int CKF_ConvertChunkIDToXMLFormat(int id, int* out)
{
    if (!out) return CKF_Err_BadArgument;
    *out = id;
    return 0;
}

void CKF_GetEffectiveProjectVersion(int* major, int* minor)
{
    if (!major || !minor) return;
    constexpr std::pair current(CKF_CurrentMajorVersion, CKF_CurrentMinorVersion);
    std::tie(*major, *minor) = std::min(current, std::pair(std::max(*major, 0), std::max(*minor, 0)));
}

bool CKF_Version_Gen7_PreUnicode(CKF_File const* file)
{
    return file && file->majorVersion <= CKF_LastPreUnicodeMajorVersion;
}
