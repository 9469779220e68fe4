#include "host/rotations.h"

#include <algorithm>
#include <cmath>
#include <numbers>

namespace kfshost {

namespace {

constexpr double DegreesPerRadian = 180.0 / std::numbers::pi;

double Dot(double const* a, double const* b)
{
    return a[0] * b[0] + a[1] * b[1] + a[2] * b[2] + a[3] * b[3];
}

// Of two unit quaternions whose signs agree. By the chord's length, which small angles don't round away.
double AngleBetween(double const* a, double const* b)
{
    double squares = 0.0;
    for (int i = 0; i < 4; ++i) squares += (b[i] - a[i]) * (b[i] - a[i]);
    return 4.0 * std::asin(std::min(1.0, std::sqrt(squares) / 2.0)) * DegreesPerRadian;
}

RotationKey Between(RotationKey const& a, RotationKey const& b, double share)
{
    RotationKey key;
    for (int i = 0; i < 4; ++i) key.value[i] = a.value[i] + (b.value[i] - a.value[i]) * share;
    Normalise(key.value);
    return key;
}

// The arc's middle, or of an odd number of units the whole unit before it: there a short piece of the half arc is as
// good as straight.
RotationKey Halfway(RotationKey const& a, RotationKey const& b)
{
    auto const length = static_cast<double>(std::int64_t{b.time} - a.time);
    RotationKey middle = Between(a, b, 0.5);
    auto const time = static_cast<int>((std::int64_t{a.time} + b.time) >> 1);
    double const share = (time - static_cast<double>(a.time)) / length;
    if (share < 0.5) middle = Between(a, middle, share * 2.0);
    middle.time = time;
    return middle;
}

void AppendArc(RotationKey const& from, RotationKey const& to, double tolerance, std::vector<RotationKey>& keys)
{
    bool const hasRoom = std::int64_t{to.time} - from.time > 1;
    if (hasRoom && ArcDeviationBound(AngleBetween(from.value, to.value)) > tolerance) {
        RotationKey const middle = Halfway(from, to);
        AppendArc(from, middle, tolerance, keys);
        keys.push_back(middle);
        AppendArc(middle, to, tolerance, keys);
    }
}

RotationKey Unit(RotationKey key)
{
    Normalise(key.value);
    return key;
}

using Matrix = double[3][3];

void ToMatrix(double const* quaternion, Matrix& m)
{
    double q[4] = {quaternion[0], quaternion[1], quaternion[2], quaternion[3]};
    Normalise(q);
    for (int i = 0; i < 3; ++i) {
        int const j = (i + 1) % 3;
        int const k = (i + 2) % 3;
        m[i][i] = 1.0 - 2.0 * (q[j] * q[j] + q[k] * q[k]);
        m[i][j] = 2.0 * (q[i] * q[j] - q[k] * q[3]);
        m[i][k] = 2.0 * (q[i] * q[k] + q[j] * q[3]);
    }
}

}  // namespace

bool IsRotation(StreamItem const& item)
{
    return item.kind == StreamKind::Rotation && item.components.size() == 4;
}

// Scaled first, so that no square is beyond what a double holds.
void Normalise(double* quaternion)
{
    double greatest = 0.0;
    for (int i = 0; i < 4; ++i) greatest = std::max(greatest, std::abs(quaternion[i]));
    if (!(greatest > 0.0) || !std::isfinite(greatest)) return;
    for (int i = 0; i < 4; ++i) quaternion[i] /= greatest;
    double const length = std::sqrt(Dot(quaternion, quaternion));
    for (int i = 0; i < 4; ++i) quaternion[i] /= length;
}

void AlignSigns(std::span<double> quaternions)
{
    for (std::size_t i = 4; i + 4 <= quaternions.size(); i += 4)
        if (Dot(&quaternions[i - 4], &quaternions[i]) < 0.0)
            for (std::size_t j = i; j < i + 4; ++j) quaternions[j] = -quaternions[j];
}

// The exact angle divided by the cube of the rotation's grows with it, to this at a half turn.
double ArcDeviationBound(double degrees)
{
    constexpr double atHalfTurn = 8.15;
    double const share = degrees / 180.0;
    return atHalfTurn * share * share * share;
}

std::vector<RotationKey> WithArcKeys(std::vector<RotationKey> const& keys, double tolerance)
{
    std::vector<RotationKey> result;
    for (std::size_t i = 0; i < keys.size(); ++i) {
        if (i > 0) AppendArc(Unit(keys[i - 1]), Unit(keys[i]), tolerance, result);
        result.push_back(keys[i]);
    }
    return result;
}

std::optional<EulerOrder> EulerOrder::Parse(std::string_view text)
{
    EulerOrder order;
    bool used[3] = {};
    if (text.size() != 3) return std::nullopt;
    for (int i = 0; i < 3; ++i) {
        std::size_t const axis = std::string_view("XYZxyz").find(text[static_cast<std::size_t>(i)]);
        if (axis == std::string_view::npos || used[axis % 3]) return std::nullopt;
        used[axis % 3] = true;
        order.axes[i] = static_cast<int>(axis % 3);
    }
    return order;
}

std::vector<std::string> EulerOrder::Components() const
{
    std::vector<std::string> names;
    for (int const axis : axes) names.push_back(static_cast<char>('X' + axis) + std::string("rotation"));
    return names;
}

void ToEuler(double const* quaternion, EulerOrder const& order, double* degrees)
{
    auto const [i, j, k] = order.axes;
    double const sign = (i + 1) % 3 == j ? 1.0 : -1.0;
    Matrix m;
    ToMatrix(quaternion, m);
    double const sine = std::clamp(sign * m[i][k], -1.0, 1.0);
    bool const isLocked = std::abs(sine) > 1.0 - 1e-12;
    degrees[0] = isLocked ? std::atan2(sign * m[k][j], m[j][j]) : std::atan2(-sign * m[j][k], m[k][k]);
    degrees[1] = std::asin(sine);
    degrees[2] = isLocked ? 0.0 : std::atan2(-sign * m[i][j], m[i][i]);
    for (int angle = 0; angle < 3; ++angle) degrees[angle] = degrees[angle] * DegreesPerRadian + 0.0;
}

}  // namespace kfshost
