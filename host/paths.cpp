#include "host/paths.h"

#include "curves/floatkeys.h"
#include "curves/tangents.h"
#include "host/import_error.h"
#include "host/storeerror.h"
#include "host/streambuilder.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <functional>

namespace kfshost {

namespace {

// Positions are this share of the route's size from where the exact length of the route would put them.
constexpr double AccuracyShare = 1e-6;

double Length(std::vector<double> const& vector)
{
    double squares = 0.0;
    for (double const number : vector) squares += number * number;
    return std::sqrt(squares);
}

// One key of the stream that is read, and room for the numbers of its sides.
struct SourceKey {
    explicit SourceKey(std::size_t dimension)
        : value(dimension),
          inX(dimension),
          inY(dimension),
          outX(dimension),
          outY(dimension),
          inSpeed(dimension),
          outSpeed(dimension)
    {}

    void Read(KFS_Stream const& stream, int index)
    {
        ThrowIfFailed(KFS_GetKeyF(&stream, index, value.data(), &inInterp, &outInterp));
        ThrowIfFailed(KFS_GetKeyTangentsF(&stream, index, inX.data(), inY.data(), outX.data(), outY.data()));
        ThrowIfFailed(KFS_GetKeyVelocityF(&stream, index, 0, inSpeed.data(), outSpeed.data()));
        if (inInterp != KFS_Interp_Spline) std::ranges::fill(inY, 0.0);
        if (outInterp != KFS_Interp_Spline) std::ranges::fill(outY, 0.0);
    }

    std::vector<double> value, inX, inY, outX, outY, inSpeed, outSpeed;
    char inInterp = 0;
    char outInterp = 0;
};

// The size of the box around the keys.
class Box {
public:
    void Add(std::vector<double> const& point)
    {
        if (low_.empty()) low_ = high_ = point;
        for (std::size_t i = 0; i < point.size(); ++i) {
            low_[i] = std::min(low_[i], point[i]);
            high_[i] = std::max(high_[i], point[i]);
        }
    }
    double Diagonal() const
    {
        std::vector<double> extent(low_.size());
        std::ranges::transform(high_, low_, extent.begin(), std::minus<>());
        return Length(extent);
    }

private:
    std::vector<double> low_;
    std::vector<double> high_;
};

int UnitsOf(KFS_Stream const& stream, int index)
{
    T_Time time{};
    ThrowIfFailed(KFS_IndexToTime(&stream, index, &time));
    return time.value;
}

}  // namespace

bool IsPosition(StreamItem const& item)
{
    return item.kind == StreamKind::Translation && (item.components.size() == 2 || item.components.size() == 3);
}

// The control points of a segment are those of the curves of its components, taken together. Its speed graph starts and
// ends with the speeds of the curves there, as a cubic with the segment's length.
std::unique_ptr<KFS_Stream> MakePath(StreamItem const& item)
{
    KFS_Stream const& source = *item.stream;
    StreamBuilder builder(item.kind, source.GetDimension(), source.GetTimeScale(), StreamForm::Path);
    SourceKey key(item.components.size());
    Box box;
    constexpr double third = 1.0 / 3.0;
    for (int i = 0; i < KeyCount(source); ++i) {
        key.Read(source, i);
        box.Add(key.value);
        builder.Append(UnitsOf(source, i), key.value.data(), static_cast<KFS_Interp>(key.inInterp),
                       static_cast<KFS_Interp>(key.outInterp));
    }
    double const size = KeyCount(source) == 0 ? 0.0 : box.Diagonal();
    if (!std::isfinite(size)) throw ImportError(item.place, "positions are too far apart for a path");
    if (size > 0.0) builder.SetPathAccuracy(size * AccuracyShare);
    for (int i = 0; i < KeyCount(source); ++i) {
        key.Read(source, i);
        builder.SetPathTangents(i, key.inY.data(), key.outY.data());
        if (item.interpolation == SourceInterpolation::CubicSpline) {
            double const inSpeed = Length(key.inSpeed);
            double const outSpeed = Length(key.outSpeed);
            builder.SetHandles(i, {&inSpeed, &third, &outSpeed, &third});
        }
    }
    return builder.Take();
}

void LetInnerKeysFloat(KFS_Stream& path)
{
    for (int i = 1; i + 1 < KeyCount(path); ++i) ThrowIfFailed(KFS_SetKeyFloat(&path, 1, i));
}

bool IsFloatKey(KFS_Stream const& path, int index)
{
    unsigned short flags = 0;
    ThrowIfFailed(KFS_GetKeyFlags(&path, index, &flags));
    return (flags & KFS_KeyFlag_Float) != 0;
}

std::size_t FloatKeyCount(KFS_Stream const& path)
{
    std::size_t count = 0;
    for (int i = 0; i < KeyCount(path); ++i) count += IsFloatKey(path, i) ? 1 : 0;
    return count;
}

}  // namespace kfshost
