// The doors to a spatial key's tangents and spatial flags.
#include "curves/spacetangents.h"

#include "curves/spacetangents_private.h"
#include "frame/boundary_private.h"
#include "frame/report_private.h"
#include "keystore/cache_private.h"
#include "keystore/check_private.h"
#include "keystore/edit_private.h"
#include "keystore/items_private.h"
#include "keystore/keylist_private.h"
#include "keystore/pins_private.h"
#include "keystore/renderstates_private.h"
#include "keystore/valuedata_private.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

// Tangents lie behind the value, where a client's block has nothing that could be called so, nor room for it.
int RefuseCustom(KFS_Stream const* stream, short operation, short row)
{
    if (!stream->IsCustom() && !stream->IsTemporarilyNonCustom()) return 0;
    return KFSp_RefuseCustomValue(operation, row);
}

int CheckSpatial(KFS_Stream const* stream, short operation)
{
    if (stream->IsSpatial()) return 0;
    return KFSp_ReportErr(operation, KFS_Err_NotSpatial, KFSp_Row_SpatialTangents);
}

// Mirror() for vectors too long to be squared. What can't be represented in the end becomes the largest number.
void MirrorScaled(double const* given, double* other, int dimension)
{
    static constexpr double largest = std::numeric_limits<double>::max();
    auto const reach = [dimension](double const* vector) {
        double result = 0.0;
        for (int i = 0; i < dimension; ++i) result = std::max(result, std::min(std::fabs(vector[i]), largest));
        return result;
    };
    auto const length = [dimension](double const* vector, double unit) {
        double sum = 0.0;
        for (int i = 0; i < dimension; ++i) sum += vector[i] / unit * (vector[i] / unit);
        return std::sqrt(sum);
    };
    double const givenReach = reach(given);
    double const otherReach = reach(other);
    double const otherLength = otherReach > 0.0 ? length(other, otherReach) : 0.0;
    double const ratio = otherLength / length(given, givenReach);
    for (int i = 0; i < dimension; ++i)
        other[i] = std::clamp(-(given[i] / givenReach * ratio) * otherReach, -largest, largest);
}

// Turns `other` against `given` and keeps its length. A zero `given` has no direction to turn to.
void Mirror(double const* given, double* other, int dimension)
{
    auto const size = static_cast<std::size_t>(dimension);
    if (KFSp_IsZero({given, size})) return;
    double const givenSquare = KFSp_SquaredLength({given, size});
    double const otherSquare = KFSp_SquaredLength({other, size});
    if (!std::isfinite(givenSquare) || !std::isfinite(otherSquare)) return MirrorScaled(given, other, dimension);
    for (int i = 0; i < dimension; ++i) {
        other[i] = -given[i];
        // Too small to be squared: the other tangent takes the given one's length.
        if (givenSquare != 0.0) other[i] = other[i] * (1.0 / std::sqrt(givenSquare)) * std::sqrt(otherSquare);
    }
}

// Copies the tangents into a record, and keeps a continuous key's two in one line.
int StoreTangents(KFS_Stream* stream, KFS_KeyScalar* key, short kind, void const* inTangent, void const* outTangent)
{
    KFS_CopyItemFunc const copy = stream->GetCopyItemFunc() ? stream->GetCopyItemFunc() : &KFSp_ConvertItemToFloat;
    KFSp_SpatialRuns<double> const runs = KFSp_GetSpatialRuns(key, stream->GetDimension());
    KFSp_FirstError error;
    if (inTangent) error.Keep(copy(stream, stream->GetItemRefcon(), kind, inTangent, runs.inTangent));
    if (outTangent && error.None())
        error.Keep(copy(stream, stream->GetItemRefcon(), kind, outTangent, runs.outTangent));
    key->flags |= KFS_KeyFlag_TangentsSet;

    bool const one = (inTangent != nullptr) != (outTangent != nullptr);
    bool const continuous = KFSp_HasSpatialBlock(key) && (key->spFlags & KFS_KeySpFlag_Continuous) != 0;
    if (error.None() && one && continuous) {
        Mirror(inTangent ? runs.inTangent : runs.outTangent, inTangent ? runs.outTangent : runs.inTangent,
               stream->GetDimension());
    }
    return error.Code();
}

// Any number may come here: a constant's index isn't looked at.
int IndexBehind(int index)
{
    return index < std::numeric_limits<int>::max() ? index + 1 : index;
}

// From now on the arcs around the key are measured anew, and its tangents are the user's.
void MarkEdited(KFS_Stream* stream, int index, KFSp_FirstError& error)
{
    error.Keep(stream->SetArcInvalid(IndexBehind(index), 2));
    error.Keep(stream->SetInvalid(IndexBehind(index), 2));
    error.Keep(KFSp_UnsetKeySpaceFlags(stream, KFS_KeySpFlag_Modifiable, index));
}

int SetTangents(KFS_Stream* stream, int index, void const* inTangent, void const* outTangent)
{
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    KFSp_FirstError error;
    if (stream->HasNoKeys()) {
        error.Keep(StoreTangents(stream, data->cache, KFS_Item_CacheValue, inTangent, outTangent));
        MarkEdited(stream, index, error);
        return error.Code();
    }
    if (KFSp_ItemCount(data) == 0)
        return KFSp_ReportErr(KFSp_Op_SetKeySpaceTangents, KFS_Err_NoKeys, KFSp_Row_AlterKey);
    error.Keep(KFSp_ClearCache(stream));
    {
        KFSp_ScKey const key(data->keys, index, error);
        if (!key.get()) return error.None() ? KFS_Err_LegacyMismatch : error.Code();
        error.Keep(StoreTangents(stream, key.get(), KFS_Item_KeyValue, inTangent, outTangent));
        MarkEdited(stream, index, error);
    }
    return error.Code();
}

int CheckAndSetTangents(KFS_Stream* stream, int index, void const* inTangent, void const* outTangent)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_SetKeySpaceTangents, stream, KFSp_Row_AlterKey); code != 0)
        return code;
    if (int const code = CheckSpatial(stream, KFSp_Op_SetKeySpaceTangents); code != 0) return code;
    if (int const code = RefuseCustom(stream, KFSp_Op_SetKeySpaceTangents, KFSp_Row_ConvertTo); code != 0) return code;
    return SetTangents(stream, index, inTangent, outTangent);
}

int ChangeSpFlags(KFS_Stream* stream, int index, unsigned int mask, unsigned int values)
{
    auto const change = [&](KFS_KeyScalar* key) {
        // What stands there in a record without the block are numbers of its value.
        if (KFSp_HasSpatialBlock(key)) key->spFlags = (key->spFlags & ~mask) | (values & mask);
    };
    KFS_StreamKeyData* const data = stream->GetKeyDataForModify();
    if (stream->HasNoKeys()) {
        change(data->cache);
        return 0;
    }
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(data->keys, index, error);
        if (key.get()) change(key.get());
    }
    return error.Code();
}

// The checks of the functions that read or change spatial flags.
int CheckKeys(KFS_Stream const* stream, short operation, short row, short noKeysOperation)
{
    if (int const code = KFSp_CheckStream(operation, stream, row); code != 0) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (!KFSp_HasNoValue(data->stream, data)) return 0;
    return KFSp_ReportErr(noKeysOperation, KFS_Err_NoKeys, KFSp_Row_InquireKey);
}

int ChangeBits(KFS_Stream* stream, short operation, unsigned int mask, unsigned int values, int index)
{
    if (int const code = CheckKeys(stream, operation, KFSp_Row_AlterKey, KFSp_Op_KeyFlags); code != 0) return code;
    KFSp_FirstError error;
    error.Keep(ChangeSpFlags(stream, index, mask, values));
    if (stream->HasKeys()) error.Keep(KFSp_ClearCache(stream));
    return error.Code();
}

int GetTangents(KFS_Stream const* stream, int index, double* inTangent, double* outTangent)
{
    if (int const code = KFSp_CheckStream(KFSp_Op_GetKeySpaceTangents, stream, KFSp_Row_GetValue); code != 0)
        return code;
    stream = KFSp_Seen(stream);
    if (int const code = CheckSpatial(stream, KFSp_Op_GetKeySpaceTangents); code != 0) return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    if (KFSp_HasNoValue(stream, data))
        return KFSp_ReportErr(KFSp_Op_GetKeySpaceTangents, KFS_Err_NoKeys, KFSp_Row_GetValue);
    if (int const code = RefuseCustom(stream, KFSp_Op_GetKeySpaceTangents, KFSp_Row_ConvertFrom); code != 0)
        return code;

    int const update = stream->UpdateStream();
    KFS_KeyScalar const* key = data->cache;
    if (stream->HasKeys()) {
        if (update != 0) return update;
        if (index < 0) return SEQ_Err_BadIndex;  // -1 would name the last key
        if (int const code = KFSp_GetConstKey(data, index, &key); code != 0) return code;
    }
    int const dimension = stream->GetDimension();
    KFSp_SpatialRuns<double const> const runs = KFSp_GetSpatialRuns(key, dimension);
    if (inTangent) std::copy_n(runs.inTangent, dimension, inTangent);
    if (outTangent) std::copy_n(runs.outTangent, dimension, outTangent);
    return 0;
}

int GetSpFlags(KFS_Stream const* stream, int index, unsigned int* flags)
{
    if (int const code = CheckKeys(stream, KFSp_Op_UnsetKeySpaceFlags, KFSp_Row_InquireKey, KFSp_Op_KeyFlags);
        code != 0)
        return code;
    KFS_StreamKeyData const* const data = stream->GetKeyData();
    stream = data->stream;
    if (stream->HasNoKeys()) {
        *flags = data->cache->flags;
        return 0;
    }
    KFS_KeyScalar const* key = nullptr;
    if (index < 0) return SEQ_Err_BadIndex;
    if (int const code = KFSp_GetConstKey(data, index, &key); code != 0) return code;
    *flags = KFSp_HasSpatialBlock(key) ? key->spFlags : 0;
    return 0;
}

int SetSpFlags(KFS_Stream* stream, int index, unsigned int mask, unsigned int values)
{
    if (int const code = CheckKeys(stream, KFSp_Op_SetKeySpFlags, KFSp_Row_AlterKey, KFSp_Op_SetKeySpFlags); code != 0)
        return code;
    int result = ChangeSpFlags(stream, index, mask, values);
    if (stream->HasNoKeys()) return result;
    if ((mask & KFS_KeySpFlag_Modifiable) != 0 || ((mask & KFS_KeySpFlag_Continuous) != 0 && result == 0))
        result = stream->SetArcInvalid(IndexBehind(index), 2);
    int const cleared = KFSp_ClearCache(stream);
    return result != 0 ? result : cleared;
}

}  // namespace

int KFSp_SetKeySpaceFlags(KFS_Stream* stream, unsigned int bits, int index)
{
    return ChangeBits(stream, KFSp_Op_SetKeySpaceFlags, bits, bits, index);
}

int KFSp_UnsetKeySpaceFlags(KFS_Stream* stream, unsigned int bits, int index)
{
    return ChangeBits(stream, KFSp_Op_UnsetKeySpaceFlags, bits, 0, index);
}

int KFS_SetKeySpaceTangents(KFS_Stream* stream, int index, int, void const* inTangent, void const* outTangent)
{
    return KFSp_Boundary([&] {
        if (int const code = CheckAndSetTangents(stream, index, inTangent, outTangent); code != 0) return code;
        stream->NotifyValueChanged();
        return 0;
    });
}

int KFS_SetKeySpaceTangentsF(KFS_Stream* stream, int index, int, double const* inTangent, double const* outTangent)
{
    return KFSp_Boundary([&] {
        if (int const code = KFSp_CheckStream(KFSp_Op_SetKeySpaceTangentsF, stream, KFSp_Row_AlterKey); code != 0)
            return code;
        KFSp_FirstError error;
        {
            KFSp_ScDoubleValues doubles(stream, &KFSp_FakeCopyItemFuncNoLimits);
            error.Keep(doubles.Code());
            if (error.None()) error.Keep(CheckAndSetTangents(stream, index, inTangent, outTangent));
            error.Keep(doubles.Restore());
        }
        // Listeners hear of it when the stream is itself again.
        if (error.None()) stream->NotifyValueChanged();
        return error.Code();
    });
}

int KFS_GetKeySpaceTangentsF(KFS_Stream const* stream, int index, int, double* inTangent, double* outTangent)
{
    return KFSp_Boundary([&] { return GetTangents(stream, index, inTangent, outTangent); });
}

int KFS_SetKeySpModifiable(KFS_Stream* stream, unsigned char on, int index)
{
    return KFSp_Boundary([&] {
        if (on == 0) return KFSp_UnsetKeySpaceFlags(stream, KFS_KeySpFlag_Modifiable, index);
        if (int const code = KFSp_SetKeySpaceFlags(stream, KFS_KeySpFlag_Modifiable, index); code != 0) return code;
        return stream->SetArcInvalid(IndexBehind(index), 2);
    });
}

int KFS_SetKeySpContinuous(KFS_Stream* stream, unsigned char on, int index)
{
    return KFSp_Boundary([&] {
        return on != 0 ? KFSp_SetKeySpaceFlags(stream, KFS_KeySpFlag_Continuous, index)
                       : KFSp_UnsetKeySpaceFlags(stream, KFS_KeySpFlag_Continuous, index);
    });
}

int KFS_GetKeySpFlags(KFS_Stream const* stream, int index, unsigned int* flags)
{
    return KFSp_Boundary([&] { return GetSpFlags(stream, index, flags); });
}

int KFS_SetKeySpFlags(KFS_Stream* stream, int index, unsigned int mask, unsigned int values)
{
    return KFSp_Boundary([&] { return SetSpFlags(stream, index, mask, values); });
}
