#include "host/scene.h"

#include "frame/errors.h"
#include "host/storeerror.h"
#include "keystore/evaluate.h"
#include "keystore/lookup.h"

#include <algorithm>

namespace kfshost {

std::string_view NameOf(StreamKind kind)
{
    switch (kind) {
    case StreamKind::Translation: return "translation";
    case StreamKind::Rotation: return "rotation";
    case StreamKind::Scale: return "scale";
    case StreamKind::Weights: return "weights";
    case StreamKind::Angles: return "angles";
    }
    return "";
}

std::string_view NameOf(SourceInterpolation interpolation)
{
    switch (interpolation) {
    case SourceInterpolation::Step: return "step";
    case SourceInterpolation::Linear: return "linear";
    case SourceInterpolation::CubicSpline: return "spline";
    }
    return "";
}

std::vector<std::string> UsualComponents(StreamKind kind, std::size_t dimension)
{
    constexpr std::string_view axes = "xyzw";
    bool const areAxes = kind != StreamKind::Weights && dimension <= axes.size();
    std::vector<std::string> names;
    for (std::size_t i = 0; i < dimension; ++i)
        names.push_back(areAxes ? std::string(1, axes[i]) : 'w' + std::to_string(i));
    return names;
}

std::string PathOf(StreamItem const& item)
{
    std::string const path = item.animation + '/' + item.node + '/' + std::string(NameOf(item.kind));
    return IsFollower(item) ? path + '/' + item.components.front() : path;
}

bool IsFollower(StreamItem const& item)
{
    return item.component != StreamItem::WholeValue;
}

bool IsSeparated(KFS_Stream const& stream)
{
    return stream.GetParent() && stream.AreDimensionsSeparated();
}

std::vector<KFS_Stream const*> MoversOf(KFS_Stream const& stream)
{
    if (!IsSeparated(stream)) return {&stream};
    std::vector<KFS_Stream const*> followers;
    stream.GetSeparationFollowers(followers);
    return followers;
}

bool HasKeys(KFS_Stream const& stream)
{
    return std::ranges::any_of(
        MoversOf(stream), [](KFS_Stream const* mover) { return KeyCount(*mover) != 0; });
}

int KeyCount(KFS_Stream const& stream)
{
    return stream.GetKeyCount();
}

Rational KeyTime(KFS_Stream const& stream, int index)
{
    T_Time time{};
    ThrowIfFailed(KFS_IndexToTime(&stream, index, &time));
    if (time.scale == 0) throw StoreError(KFS_Err_NoKeys);
    return {time.value, time.scale};
}

void ReadAt(KFS_Stream const& stream, Rational const& seconds, double* values, KFS_ParamBag const* bag)
{
    T_Time const time{seconds.ToUnits(stream.GetTimeScale()), stream.GetTimeScale()};
    ThrowIfFailed(KFS_GetValueFPlus(&stream, &time, 0, values, nullptr, bag));
}

}  // namespace kfshost
