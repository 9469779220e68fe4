#include "frame/timehelpers.h"

#include "frame/boundary_private.h"

#include <climits>

namespace {

int ToScale(int code, unsigned int scale, T_Time* result)
{
    if (code != 0 || scale == 0) return code;
    int const converted = T_ShortConvTime(result->value, result->scale, scale, &result->value);
    result->scale = converted == 0 ? scale : 0;
    return converted;
}

int Subtract(T_Time const& a, T_Time const& b, T_Time* result)
{
    // The least value has no negative; the difference may fit all the same.
    if (b.value == INT_MIN)
        return KFSp_Boundary([&] {
            *result = a - b;
            return 0;
        });
    T_Time const negated{-b.value, b.scale};
    return T_AddTime(&a, &negated, result);
}

}  // namespace

int KFS_AddTime(T_Time const* a, T_Time const* b, unsigned int scale, T_Time* result)
{
    return ToScale(T_AddTime(a, b, result), scale, result);
}

int KFS_SubTime(T_Time const* a, T_Time const* b, unsigned int scale, T_Time* result)
{
    return ToScale(Subtract(*a, *b, result), scale, result);
}

int KFS_MulTime(T_Time const* a, M_Ratio const* ratio, unsigned int scale, T_Time* result)
{
    return ToScale(T_MulTime(a, ratio, result), scale, result);
}

void KFS_MixInTime(hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>& hash, T_Time const& time)
{
    T_Time reduced{};
    unsigned char changed = 0;
    KFSp_ThrowIf(T_ReduceTime(&time, &reduced, &changed));
    hash.MixNumber(reduced.value);
    hash.MixNumber(reduced.scale);
}
