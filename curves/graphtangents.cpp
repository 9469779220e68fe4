// Temporal handles as graph tangents, what curve editors draw. Apart from speeds and influences: the limits differ.
#include "curves/keyhandles_private.h"
#include "curves/tangents.h"
#include "keystore/pins_private.h"

#include <algorithm>
#include <cmath>
#include <limits>

namespace {

constexpr double MinInfluence = 0.0001;  // of a handle that is set as a graph tangent on a plain stream
constexpr double MaxInfluence = 1.0;
constexpr double NoDuration = 1e-12;

// A side's graph tangent as a caller gives it.
struct Given {
    double const* x;
    double const* y;
    bool Whole() const { return x && y; }
};

void StoreTangent(KFSp_Handles<double> const& handles, KFSp_Side side, Given const& given, double duration,
                  bool limited)
{
    for (int i = 0; i < handles.count; ++i) {
        double const x = side == KFSp_Side::In ? std::min(given.x[i], 0.0) : std::max(given.x[i], 0.0);
        double const influence = std::fabs(x / duration);
        handles.speed[i] = x != 0.0 ? given.y[i] / x : 0.0;
        handles.influence[i] = limited ? std::clamp(influence, MinInfluence, MaxInfluence) : influence;
    }
}

void ForbidFalling(KFSp_Handles<double> const& handles)
{
    for (int i = 0; i < handles.count; ++i)
        if (handles.speed[i] < 0.0) handles.speed[i] = 0.0;
}

// How many times as long one handle is as another of the same duration, both with speeds too large to be squared: in a
// graph that is drawn smaller, where they aren't.
double LengthRatio(double speed, double newSpeed, double yScale)
{
    constexpr double largest = std::numeric_limits<double>::max();
    double const tallness = std::fabs(yScale);
    double const width = tallness > 1.0 ? 1.0 / tallness : 1.0;
    auto const scaled = [&](double v) { return std::min(std::fabs(v), largest) * (tallness > 1.0 ? 1.0 : tallness); };
    auto const length = [width](double height, double unit) {
        return std::sqrt((height / unit) * (height / unit) + (width / unit) * (width / unit));
    };
    double const height = scaled(speed);
    double const newHeight = scaled(newSpeed);
    double const unit = std::max(height, width);
    double const newUnit = std::max(newHeight, width);
    return std::min(unit / newUnit, largest) * length(height, unit) / length(newHeight, newUnit);
}

// The influence that keeps a handle's length in the graph when its speed changes.
double KeepLength(double influence, double speed, double newSpeed, double duration, double yScale)
{
    double const x = influence * duration;
    double const y = speed * yScale;
    double const newY = newSpeed * yScale;
    if (std::fabs(duration) < NoDuration) return x;
    bool const squares = std::isfinite(y * y) && std::isfinite(newY * newY);
    double const newX = squares ? std::sqrt((y * y + 1.0) * (x * x) / (newY * newY + 1.0))
                                : std::fabs(x) * LengthRatio(speed, newSpeed, yScale);
    return std::clamp(newX / duration, MinInfluence, MaxInfluence);
}

// Turns a continuous key's other side along.
void TurnAlong(KFSp_Handles<double> const& turned, KFSp_Handles<double> const& other, double duration, double yScale,
               bool keepLength)
{
    for (int i = 0; i < turned.count; ++i) {
        double const speed = turned.speed[i];
        if (keepLength) other.influence[i] = KeepLength(other.influence[i], other.speed[i], speed, duration, yScale);
        other.speed[i] = speed;
    }
}

int SetTangents(KFS_Stream* stream, int index, Given const& in, Given const& out, double yScale)
{
    KFSp_FirstError error;
    {
        KFSp_ScKey const key(stream->GetKeys(), index, error);
        KFSp_Durations durations;
        if (error.None()) error.Keep(KFSp_GetDurations(stream, index, key.get(), &durations));
        if (error.None()) {
            bool const spatial = stream->IsSpatial();
            bool const nonDecreasing = spatial && (stream->GetKFSFlags() & KFS_StreamFlag_NonDecreasing) != 0;
            bool const continuous = (key->flags & KFS_KeyFlag_Continuous) != 0;
            auto const set = [&](KFSp_Side side, Given const& given, bool both) {
                KFSp_Side const otherSide = side == KFSp_Side::In ? KFSp_Side::Out : KFSp_Side::In;
                KFSp_Handles<double> const handles = KFSp_GetHandles(stream, key.get(), side);
                StoreTangent(handles, side, given, durations[side], !spatial);
                if (nonDecreasing) ForbidFalling(handles);
                if (continuous && !both) {
                    TurnAlong(handles, KFSp_GetHandles(stream, key.get(), otherSide), durations[otherSide], yScale,
                              !spatial);
                    error.Keep(stream->SetInvalid(index + 1, 2));
                } else {
                    error.Keep(stream->SetInvalid(side == KFSp_Side::In ? index : index + 1, 1));
                }
            };
            if (in.Whole() && durations.hasPrev) set(KFSp_Side::In, in, out.Whole());
            if (out.Whole() && durations.hasNext) set(KFSp_Side::Out, out, in.Whole());
        }
    }
    return error.Code();
}

void ReadTangent(KFS_Stream const* stream, KFSp_SideTangent const& tangent, double* x, double* y)
{
    int const count = KFSp_HandleArraySize(stream);
    for (int i = 0; i < count; ++i) {
        if (x) x[i] = tangent.X(i);
        if (y) y[i] = tangent.Y(i);
    }
}

int SetKeyTangents(KFS_Stream* stream, int index, Given const& in, Given const& out, double yScale)
{
    if (int const code = KFSp_CheckHandleAccess(stream, {KFSp_Op_SetKeyTangents, KFSp_Row_GetValue},
                                                {KFSp_Op_GetKeyTangents, KFSp_Row_GetValue}))
        return code;
    KFSp_FirstError error;
    if (stream->HasKeys()) error.Keep(SetTangents(stream, index, in, out, yScale));
    return KFSp_FinishHandleEdit(stream, error);
}

int GetKeyTangents(KFS_Stream const* stream, int index, double* inX, double* inY, double* outX, double* outY)
{
    KFSp_Refusal const refusal{KFSp_Op_GetKeyTangents, KFSp_Row_GetValue};
    if (int const code = KFSp_CheckHandleAccess(stream, refusal, refusal)) return code;
    stream = KFSp_Seen(stream);
    if (int const code = stream->UpdateStreamIfStaleTangents(index)) return code;
    KFS_KeyScalar* key = nullptr;
    if (int const code = KFSp_GetHandleKey(stream, stream->GetKeyData(), index, &key)) return code;
    KFSp_Durations durations;
    if (int const code = KFSp_GetDurations(stream, index, key, &durations)) return code;
    ReadTangent(stream, {stream, key, KFSp_Side::In, durations}, inX, inY);
    ReadTangent(stream, {stream, key, KFSp_Side::Out, durations}, outX, outY);
    return 0;
}

}  // namespace

int KFS_SetKeyTangentsF(KFS_Stream* stream, int index, double const* inX, double const* inY, double const* outX,
                        double const* outY, double yScale)
{
    return KFSp_Boundary([&] { return SetKeyTangents(stream, index, {inX, inY}, {outX, outY}, yScale); });
}

int KFS_GetKeyTangentsF(KFS_Stream const* stream, int index, double* inX, double* inY, double* outX, double* outY)
{
    return KFSp_Boundary([&] { return GetKeyTangents(stream, index, inX, inY, outX, outY); });
}
