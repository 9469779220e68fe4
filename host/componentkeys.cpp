// How keys look to one component, and how such keys become those of a stream. Which streams take part is said in
// dimensions.cpp.
#include "host/componentkeys_private.h"

#include "curves/derivatives.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "host/storeerror.h"
#include "keystore/edit.h"
#include "keystore/evaluate.h"
#include "keystore/keyflags.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <array>
#include <cmath>

namespace kfshost {

namespace {

constexpr double OneSixth = 0.16666666667;  // the handle of a linear side in a segment that curves on the other
constexpr double Third = 1.0 / 3.0;
constexpr unsigned short CarriedFlags = KFS_KeyFlag_Continuous | KFS_KeyFlag_Modifiable;

int TimeOf(KFS_Stream const& stream, int index)
{
    T_Time time{};
    ThrowIfFailed(KFS_IndexToTime(&stream, index, &time));
    return time.value;
}

// An undecided side is read as one that holds.
char Decided(char interp)
{
    return interp == KFS_Interp_None ? static_cast<char>(KFS_Interp_Hold) : interp;
}

double Length(std::span<double const> vector)
{
    double squares = 0.0;
    for (double const number : vector) squares += number * number;
    return std::sqrt(squares);
}

// ---- paths

using Point = std::vector<double>;

struct PathKey {
    int time = 0;
    char in = 0;
    char out = 0;
    bool floats = false;
    Point value, inTangent, outTangent;
    double inSpeed = 0.0, outSpeed = 0.0, inInfluence = 0.0, outInfluence = 0.0;
};

PathKey ReadPathKey(KFS_Stream const& path, int index)
{
    auto const dimension = static_cast<std::size_t>(path.GetDimension());
    PathKey key;
    key.value.resize(dimension);
    key.inTangent.resize(dimension);
    key.outTangent.resize(dimension);
    ThrowIfFailed(KFS_GetKeySpaceTangentsF(&path, index, 0, key.inTangent.data(), key.outTangent.data()));
    ThrowIfFailed(KFS_GetKeyF(&path, index, key.value.data(), &key.in, &key.out));
    ThrowIfFailed(KFS_GetKeyVelocityF(&path, index, 1, &key.inSpeed, &key.outSpeed));
    ThrowIfFailed(KFS_GetKeyInfluence(&path, index, &key.inInfluence, &key.outInfluence));
    key.time = TimeOf(path, index);
    key.in = Decided(key.in);
    key.out = Decided(key.out);
    unsigned short flags = 0;
    ThrowIfFailed(KFS_GetKeyFlags(&path, index, &flags));
    key.floats = (flags & KFS_KeyFlag_Float) != 0 && index > 0 && index + 1 < path.GetKeyCount();
    if (!key.floats) return key;
    T_Time const at{key.time, path.GetTimeScale()};
    ThrowIfFailed(KFS_GetDeriv(&path, &at, KFS_Deriv_Velocity, 0, KFS_EvalFlag_NoExpression, &key.outSpeed, nullptr,
                               nullptr, {}, {}));
    key.inSpeed = key.outSpeed;
    return key;
}

// The unit vector from the first of some points to the first of the others that is elsewhere; zeros if none is.
Point Direction(Point const& from, std::array<Point, 3> const& others)
{
    for (Point const& to : others) {
        Point way(from.size());
        std::ranges::transform(to, from, way.begin(), std::minus<>());
        double const length = Length(way);
        if (!(length > 0.0) || !std::isfinite(length)) continue;
        for (double& number : way) number /= length;
        return way;
    }
    return Point(from.size());
}

Point Sum(Point const& a, Point const& b)
{
    Point sum(a.size());
    std::ranges::transform(a, b, sum.begin(), std::plus<>());
    return sum;
}

bool IsZero(Point const& point)
{
    return std::ranges::all_of(
        point, [](double number) { return number == 0.0; });
}

// From one key of a path to the next.
class Arc {
public:
    Arc(PathKey const& a, PathKey const& b) : a_(a), b_(b), isBent_(!IsZero(a.outTangent) || !IsZero(b.inTangent)) {}

    bool IsHeld() const { return a_.out == KFS_Interp_Hold || b_.in == KFS_Interp_Hold; }
    bool IsBent() const { return isBent_ && !IsHeld(); }

    // Both keys' facing sides, of each component.
    void Put(std::size_t index, std::vector<ComponentKeys>& components) const
    {
        Point const p1 = Sum(a_.value, a_.outTangent);
        Point const p2 = Sum(b_.value, b_.inTangent);
        Point const start = Direction(a_.value, {p1, p2, b_.value});
        Point const backward = Direction(b_.value, {p2, p1, a_.value});
        for (std::size_t d = 0; d < components.size(); ++d) {
            KeySide& out = components[d][index].out;
            KeySide& in = components[d][index + 1].in;
            out = {a_.out, a_.outSpeed * start[d], a_.outInfluence};
            in = {b_.in, -b_.inSpeed * backward[d], b_.inInfluence};
            if (IsHeld()) continue;
            // A linear side is a handle too, on the chord of the speed graph, where it isn't linear all along.
            bool const isLinear = a_.out == KFS_Interp_Linear && b_.in == KFS_Interp_Linear;
            bool const isPart = a_.floats || b_.floats;  // of a speed graph, which has no handles here
            if (isLinear && !IsBent() && !isPart) continue;
            for (KeySide* const side : {&out, &in}) {
                if (isLinear || isPart)
                    side->influence = Third;
                else if (side->interp == KFS_Interp_Linear)
                    side->influence = OneSixth;
                side->interp = KFS_Interp_Spline;
            }
        }
    }

private:
    PathKey const& a_;
    PathKey const& b_;
    bool isBent_;
};

// ---- keys of streams

struct Row {
    explicit Row(std::size_t size) : value(size), inSpeed(size), outSpeed(size), inInfluence(size), outInfluence(size)
    {}
    std::vector<double> value, inSpeed, outSpeed, inInfluence, outInfluence;
};

void CarryFlags(KFS_Stream& stream, int index, unsigned short flags, unsigned short mask)
{
    unsigned short present = 0;
    ThrowIfFailed(KFS_GetKeyFlags(&stream, index, &present));
    if (((present ^ flags) & mask) != 0) ThrowIfFailed(KFS_SetKeyFlags(&stream, index, mask, flags));
}

// Speeds come behind the flag that keeps both sides alike, and before the one by which they are computed.
void PutHandles(KFS_Stream& curves, int index, Row const& row, unsigned short flags)
{
    CarryFlags(curves, index, flags, KFS_KeyFlag_Continuous);
    ThrowIfFailed(KFS_SetKeyVelocityF(&curves, index, row.inSpeed.data(), row.outSpeed.data()));
    ThrowIfFailed(KFS_SetKeyInfluence(&curves, index, row.inInfluence.data(), row.outInfluence.data()));
    CarryFlags(curves, index, flags, KFS_KeyFlag_Modifiable);
}

// The ends of the components' handles, taken together, are the route's; its speed is theirs.
void PutPathHandles(KFS_Stream& path, int index, Row const& row, KeySide const& in, KeySide const& out, double before,
                    double after)
{
    auto const tangent = [&](std::vector<double> const& speed, std::vector<double> const& influence, double seconds,
                             char interp) {
        Point offset(row.value.size());
        for (std::size_t d = 0; interp == KFS_Interp_Spline && d < offset.size(); ++d)
            offset[d] = speed[d] * influence[d] * seconds;
        return offset;
    };
    Point const inTangent = tangent(row.inSpeed, row.inInfluence, -before, in.interp);
    Point const outTangent = tangent(row.outSpeed, row.outInfluence, after, out.interp);
    ThrowIfFailed(KFS_SetKeySpaceTangentsF(&path, index, 0, inTangent.data(), outTangent.data()));
    double const inSpeed = Length(row.inSpeed);
    double const outSpeed = Length(row.outSpeed);
    double const inInfluence = *std::ranges::max_element(row.inInfluence);
    double const outInfluence = *std::ranges::max_element(row.outInfluence);
    ThrowIfFailed(KFS_SetKeyVelocityF(&path, index, &inSpeed, &outSpeed));
    ThrowIfFailed(KFS_SetKeyInfluence(&path, index, &inInfluence, &outInfluence));
}

}  // namespace

std::vector<ComponentKeys> KeysOfCurves(KFS_Stream const& stream)
{
    auto const dimension = static_cast<std::size_t>(stream.GetDimension());
    int const count = stream.GetKeyCount();
    std::vector<ComponentKeys> components(dimension, ComponentKeys(static_cast<std::size_t>(count)));
    Row row(dimension);
    for (int i = 0; i < count; ++i) {
        char in = 0;
        char out = 0;
        unsigned short flags = 0;
        ThrowIfFailed(KFS_GetKeyVelocityF(&stream, i, 0, row.inSpeed.data(), row.outSpeed.data()));
        ThrowIfFailed(KFS_GetKeyInfluence(&stream, i, row.inInfluence.data(), row.outInfluence.data()));
        ThrowIfFailed(KFS_GetKeyF(&stream, i, row.value.data(), &in, &out));
        ThrowIfFailed(KFS_GetKeyFlags(&stream, i, &flags));
        int const time = TimeOf(stream, i);
        for (std::size_t d = 0; d < dimension; ++d) {
            components[d][static_cast<std::size_t>(i)] = {time,
                                                          row.value[d],
                                                          {Decided(in), row.inSpeed[d], row.inInfluence[d]},
                                                          {Decided(out), row.outSpeed[d], row.outInfluence[d]},
                                                          static_cast<unsigned short>(flags & CarriedFlags)};
        }
    }
    return components;
}

PathKeys KeysOfPath(KFS_Stream const& path)
{
    auto const count = static_cast<std::size_t>(path.GetKeyCount());
    PathKeys result;
    result.components.resize(static_cast<std::size_t>(path.GetDimension()), ComponentKeys(count));
    PathKey before;
    for (std::size_t i = 0; i < count; ++i) {
        PathKey key = ReadPathKey(path, static_cast<int>(i));
        for (std::size_t d = 0; d < result.components.size(); ++d)
            result.components[d][i] = {key.time, key.value[d], {key.in, 0.0, OneSixth}, {key.out, 0.0, OneSixth}, 0};
        if (i > 0) {
            Arc const arc(before, key);
            arc.Put(i - 1, result.components);
            result.bentArcs += arc.IsBent() ? 1 : 0;
        }
        result.floatKeys += key.floats ? 1 : 0;
        before = std::move(key);
    }
    return result;
}

void PutKeys(KFS_Stream& stream, std::span<ComponentKeys const> components)
{
    ComponentKeys const& first = components.front();
    unsigned int const scale = stream.GetTimeScale();
    Row row(components.size());
    auto const collect = [&](std::size_t i) {
        for (std::size_t d = 0; d < components.size(); ++d) {
            ComponentKey const& key = components[d][i];
            row.value[d] = key.value;
            row.inSpeed[d] = key.in.speed;
            row.outSpeed[d] = key.out.speed;
            row.inInfluence[d] = key.in.influence;
            row.outInfluence[d] = key.out.influence;
        }
    };
    for (std::size_t i = 0; i < first.size(); ++i) {
        collect(i);
        T_Time const time{first[i].time, scale};
        ThrowIfFailed(KFS_InsertKeyF(&stream, &time, 0, row.value.data(), first[i].in.interp, first[i].out.interp));
    }
    auto const seconds = [&](std::size_t from, std::size_t to) {
        return (static_cast<double>(first[to].time) - first[from].time) / scale;
    };
    for (std::size_t i = 0; i < first.size(); ++i) {
        int const index = static_cast<int>(i);
        unsigned short flags = CarriedFlags;
        for (ComponentKeys const& keys : components) flags &= keys[i].flags;
        bool const isCurved = first[i].in.interp == KFS_Interp_Spline || first[i].out.interp == KFS_Interp_Spline;
        if (isCurved || stream.IsSpatial()) collect(i);
        if (stream.IsSpatial()) {
            PutPathHandles(stream, index, row, first[i].in, first[i].out, i > 0 ? seconds(i - 1, i) : 0.0,
                           i + 1 < first.size() ? seconds(i, i + 1) : 0.0);
        } else if (isCurved) {
            PutHandles(stream, index, row, flags);
        } else {
            CarryFlags(stream, index, flags, CarriedFlags);
        }
    }
}

}  // namespace kfshost
