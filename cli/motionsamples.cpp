#include "cli/motionsamples.h"

#include "curves/spacetangents.h"
#include "frame/services/curvekernel.h"
#include "host/paths.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <cstdint>

using kfshost::Rational;
using kfshost::StreamItem;
using kfshost::ThrowIfFailed;

namespace {

// Which of x, y and z each component is: by its name's first letter, else by its place.
std::array<std::size_t, 3> AxesOf(StreamItem const& item)
{
    std::array<std::size_t, 3> axes{0, 1, 2};
    std::array<bool, 3> taken{};
    for (std::size_t d = 0; d < item.components.size(); ++d) {
        std::size_t const letter = std::string_view("xyzXYZ").find(item.components[d].front());
        if (letter == std::string_view::npos || taken[letter % 3]) return {0, 1, 2};
        axes[d] = letter % 3;
        taken[letter % 3] = true;
    }
    return axes;
}

class Sampler {
public:
    explicit Sampler(StreamItem const& item) : item_(item), stream_(*item.stream), axes_(AxesOf(item)) {}

    MotionSamples Run(double pointsPerSecond)
    {
        int const keys = kfshost::KeyCount(stream_);
        for (int i = 0; i < keys; ++i) {
            AddKey(i);
            if (i > 0) AddSegment(static_cast<std::size_t>(i), pointsPerSecond);
        }
        return std::move(samples_);
    }

    Place Read(Rational const& time) const
    {
        double row[3] = {};
        kfshost::ReadAt(stream_, time, row);
        return ToPlace(row);
    }

private:
    Place ToPlace(double const* row) const
    {
        Place place{};
        for (std::size_t d = 0; d < item_.components.size(); ++d) place[axes_[d]] = row[d];
        return place;
    }

    void AddKey(int index)
    {
        double value[3] = {};
        double in[3] = {};
        double out[3] = {};
        outBefore_ = out_;
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, value, &in_, &out_));
        ThrowIfFailed(KFS_GetKeySpaceTangentsF(&stream_, index, -1, in, out));
        for (std::size_t d = 0; d < item_.components.size(); ++d) {
            in[d] += value[d];
            out[d] += value[d];
        }
        timeBefore_ = time_;
        time_ = kfshost::KeyTime(stream_, index);
        samples_.keys.push_back(
            {time_.ToDouble(), ToPlace(value), ToPlace(in), ToPlace(out), kfshost::IsFloatKey(stream_, index)});
    }

    // The segment that ends at the key added last.
    void AddSegment(std::size_t index, double pointsPerSecond)
    {
        MotionKey const& from = samples_.keys[index - 1];
        MotionKey const& to = samples_.keys[index];
        if (outBefore_ == KFS_Interp_Hold || in_ == KFS_Interp_Hold) {
            samples_.segments.push_back({{from.place, to.place}, true});
            samples_.speed.push_back({from.seconds, 0.0});
            samples_.speed.push_back({to.seconds, 0.0});
            return;
        }
        samples_.segments.push_back({Route(from, to), false});
        bool const isLinear = outBefore_ == KFS_Interp_Linear && in_ == KFS_Interp_Linear;
        double const wanted = (to.seconds - from.seconds) * pointsPerSecond;
        AddSpeed(isLinear ? 1 : std::clamp(static_cast<std::int64_t>(wanted), std::int64_t{24}, std::int64_t{4000}));
    }

    static std::vector<Place> Route(MotionKey const& from, MotionKey const& to)
    {
        constexpr int pieces = 48;
        if (from.outEnd == from.place && to.inEnd == to.place) return {from.place, to.place};
        Place points[] = {from.place, from.outEnd, to.inEnd, to.place};
        CRV_Curve const curve{3, points[0].data(), points[1].data(), points[2].data(), points[3].data()};
        std::vector<Place> route(pieces + 1);
        for (int i = 0; i <= pieces; ++i)
            ThrowIfFailed(CRV_EvaluatePoint(&curve, route[static_cast<std::size_t>(i)].data(), i / double{pieces}));
        return route;
    }

    // The speed in the middle of a piece is the way across it by its time; the outermost pieces stand for the limits at
    // the segment's ends.
    void AddSpeed(std::int64_t pieces)
    {
        unsigned int const scale = stream_.GetTimeScale();
        std::int64_t const start = timeBefore_.ToUnits(scale);
        std::int64_t const length = time_.ToUnits(scale) - start;
        pieces = std::min(pieces, length);
        Place before = samples_.keys[samples_.keys.size() - 2].place;
        std::int64_t unitsBefore = start;
        for (std::int64_t i = 1; i <= pieces; ++i) {
            std::int64_t const units = start + length * i / pieces;
            Place const place = Read(Rational(units, scale));
            double const from = static_cast<double>(unitsBefore) / scale;
            double const to = static_cast<double>(units) / scale;
            double const speed = DistanceBetween(before, place) / (to - from);
            if (i == 1) samples_.speed.push_back({from, speed});
            samples_.speed.push_back({(from + to) / 2, speed});
            if (i == pieces) samples_.speed.push_back({to, speed});
            before = place;
            unitsBefore = units;
        }
    }

    StreamItem const& item_;
    KFS_Stream const& stream_;
    std::array<std::size_t, 3> axes_;
    MotionSamples samples_;
    char in_ = 0;
    char out_ = 0;
    char outBefore_ = 0;
    Rational time_;
    Rational timeBefore_;
};

}  // namespace

MotionSamples SampleMotion(StreamItem const& item, double pointsPerSecond)
{
    return Sampler(item).Run(pointsPerSecond);
}

std::vector<Place> PlacesAt(StreamItem const& item, std::vector<Rational> const& times)
{
    Sampler const sampler(item);
    std::vector<Place> places;
    for (Rational const& time : times) places.push_back(sampler.Read(time));
    return places;
}

double DistanceBetween(Place const& a, Place const& b)
{
    double squares = 0.0;
    for (std::size_t i = 0; i < 3; ++i) squares += (b[i] - a[i]) * (b[i] - a[i]);
    return std::sqrt(squares);
}
