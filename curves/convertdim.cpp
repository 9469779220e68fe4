// A stream of two or three dimensions filled from one of three or two.
#include "curves/manipulate.h"
#include "curves/segment_private.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/attributes.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/curvehooks_private.h"
#include "keystore/edit.h"
#include "keystore/keyflags.h"
#include "keystore/keylist_private.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <array>

namespace {

constexpr int MostDimensions = 3;
using Numbers = std::array<double, MostDimensions>;

Numbers AllOf(double number)
{
    Numbers numbers;
    numbers.fill(number);
    return numbers;
}

bool IsFlatOrSolid(int dimension)
{
    return dimension == 2 || dimension == 3;
}

int Check(short newDimension, KFS_Stream const* source, KFS_Stream const* destination)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_ConvertStreamDim, source, KFSp_Row_CopyKeyFrom)) return code;
    if (int const code = KFSp_CheckStream(KFSp_Op_ConvertStreamDim, destination, KFSp_Row_CopyKeyTo)) return code;
    for (int const dimension : {int{source->GetDimension()}, int{newDimension}, int{destination->GetDimension()}})
        if (!IsFlatOrSolid(dimension)) return KFSp_ReportErr(KFSp_Op_ConvertStreamDim, KFS_Err_Only2D3D, 0);
    if (KFSp_HasCustomRecords(source) || KFSp_HasCustomRecords(destination))
        return KFSp_ReportErr(KFSp_Op_ConvertStreamDim, KFS_Err_CustomNotAllowed, 0);
    return 0;
}

// The flags say how records are laid out and whether there is a list, so what doesn't fit the new ones goes first.
int TakeFlags(KFS_Stream const* source, KFS_Stream* destination)
{
    bool const otherRecords = source->IsSpatial() != destination->IsSpatial();
    bool const listGoes = destination->HasKeys() && (otherRecords || source->HasNoKeys());
    if (listGoes || (destination->HasNoKeys() && source->HasKeys())) {
        if (int const code = destination->SetConstant(listGoes, 0)) return code;
    }
    if (otherRecords || listGoes) {
        if (int const code = KFSp_ClearCache(destination)) return code;
    }
    unsigned short const before = destination->GetKFSFlags();
    destination->SetKFSFlags(source->GetKFSFlags());
    if (otherRecords) {
        int const code = KFSp_Boundary([&] { destination->AllocateCache(); });
        if (code != 0) {
            destination->SetKFSFlags(before);
            return code;
        }
        destination->SetInterpFunc(source->IsSpatial() ? KFSp_InterpolateSpatial : KFSp_Interpolate);
    }
    destination->ShowChangeInCopy();
    return 0;
}

int TakePathSettings(KFS_Stream const* source, KFS_Stream* destination)
{
    double accuracy = 0.0;
    Numbers multiplier = AllOf(1.0);
    if (int const code = KFS_GetStreamMultiplier(source, multiplier.data())) return code;
    if (int const code = KFS_SetStreamMultiplier(destination, multiplier.data(), nullptr)) return code;
    if (int const code = KFS_SetStreamSpInterp(destination, source->GetSpInterp())) return code;
    if (int const code = KFS_GetStreamAccuracy(source, &accuracy)) return code;
    return KFS_SetStreamAccuracy(destination, &accuracy, nullptr);
}

int CountValues(KFS_Stream const* source)
{
    return source->HasNoKeys() ? 1 : KFSp_ItemCount(source->GetKeyData());
}

// A key with its place on the path.
int CopyValue(double fillValue, KFS_Stream const* source, KFS_Stream* destination, int index)
{
    T_Time time{0, source->GetTimeScale()};
    Numbers value = AllOf(fillValue);
    Numbers in = AllOf(0.0);
    Numbers out = AllOf(0.0);
    char inInterp = 0;
    char outInterp = 0;
    if (source->HasKeys()) {
        if (int const code = KFS_IndexToTime(source, index, &time)) return code;
    }
    if (int const code = KFS_GetKeyF(source, index, value.data(), &inInterp, &outInterp)) return code;
    if (source->IsSpatial()) {
        if (int const code = KFS_GetKeySpaceTangentsF(source, index, -1, in.data(), out.data())) return code;
    }
    if (int const code = KFS_InsertKeyF(destination, &time, 1, value.data(), inInterp, outInterp)) return code;
    return source->IsSpatial() ? KFS_SetKeySpaceTangentsF(destination, index, -1, in.data(), out.data()) : 0;
}

// What shapes the curve around a key.
int CopyShape(KFS_Stream const* source, KFS_Stream* destination, int index)
{
    Numbers inSpeed = AllOf(0.0);
    Numbers outSpeed = AllOf(0.0);
    Numbers inInfluence = AllOf(KFSp_OneSixth);
    Numbers outInfluence = AllOf(KFSp_OneSixth);
    char inInterp = 0;
    char outInterp = 0;
    unsigned short flags = 0;
    unsigned int spFlags = 0;
    bool const spatial = source->IsSpatial();
    if (int const code = KFS_GetKey(source, index, nullptr, &inInterp, &outInterp)) return code;
    if (int const code = KFS_GetKeyVelocityF(source, index, 0, inSpeed.data(), outSpeed.data())) return code;
    if (int const code = KFS_GetKeyInfluence(source, index, inInfluence.data(), outInfluence.data())) return code;
    if (int const code = KFS_GetKeyFlags(source, index, &flags)) return code;
    if (int const code = spatial ? KFS_GetKeySpFlags(source, index, &spFlags) : 0) return code;

    if (int const code = KFS_SetKey(destination, index, nullptr, inInterp, outInterp)) return code;
    if (int const code = KFS_SetKeyVelocityF(destination, index, inSpeed.data(), outSpeed.data())) return code;
    if (int const code = KFS_SetKeyInfluence(destination, index, inInfluence.data(), outInfluence.data())) return code;
    if (int const code = spatial ? KFS_SetKeySpFlags(destination, index, 0xFFFF, spFlags) : 0) return code;
    if (int const code = KFS_SetKeyFlags(destination, index, 0xFFFF, flags)) return code;
    if ((flags & KFS_KeyFlag_Continuous) == 0) return 0;
    // Becoming continuous has made its sides equal, which the source's aren't where one is linear, and its handles the
    // user's.
    if (int const code = KFS_SetKeyVelocityF(destination, index, inSpeed.data(), outSpeed.data())) return code;
    return KFS_SetKeyFlags(destination, index, KFS_KeyFlag_Modifiable, flags);
}

int Convert(short newDimension, double fillValue, KFS_Stream const* source, KFS_Stream* destination)
{
    if (int const code = Check(newDimension, source, destination)) return code;
    if (int const code = TakeFlags(source, destination)) return code;
    if (source->IsSpatial()) {
        if (int const code = TakePathSettings(source, destination)) return code;
    }
    for (int i = 0; i < CountValues(source); ++i)
        if (int const code = CopyValue(fillValue, source, destination, i)) return code;
    if (destination->HasNoKeys()) return 0;
    // Now that all keys stand: automatic handles and float times are made from the keys around.
    for (int i = 0; i < CountValues(source); ++i)
        if (int const code = CopyShape(source, destination, i)) return code;
    return 0;
}

}  // namespace

int KFS_ConvertStreamDim(short newDimension, double fillValue, KFS_Stream const* source, KFS_Stream* destination)
{
    return KFSp_Boundary([&] { return Convert(newDimension, fillValue, source, destination); });
}
