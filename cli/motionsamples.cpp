#include "cli/motionsamples.h"

#include "cli/rates.h"
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

    MotionSamples Run(TimeSpan const& part, double pointsPerSecond)
    {
        part_ = part;
        int const keys = kfshost::KeyCount(stream_);
        Key before;
        for (int i = 0; i < keys; ++i) {
            Key const key = ReadKey(i, i == 0 || i + 1 == keys);
            if (i > 0 && before.time < part.last && key.time > part.first) AddSegment(before, key, i, pointsPerSecond);
            if (key.time >= part.first && key.time <= part.last) samples_.keys.push_back(key.mark);
            before = key;
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

    struct Key {
        MotionKey mark;
        Rational time;
        char in = 0;
        char out = 0;
    };

    Key ReadKey(int index, bool isEnd) const
    {
        double value[3] = {};
        double in[3] = {};
        double out[3] = {};
        Key key{};
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, value, &key.in, &key.out));
        ThrowIfFailed(KFS_GetKeySpaceTangentsF(&stream_, index, -1, in, out));
        for (std::size_t d = 0; d < item_.components.size(); ++d) {
            in[d] += value[d];
            out[d] += value[d];
        }
        key.time = kfshost::KeyTime(stream_, index);
        key.mark = {
            key.time.ToDouble(), ToPlace(value), ToPlace(in), ToPlace(out), kfshost::IsFloatKey(stream_, index), isEnd};
        return key;
    }

    void AddSegment(Key const& before, Key const& key, int index, double pointsPerSecond)
    {
        MotionKey const& from = before.mark;
        MotionKey const& to = key.mark;
        double const first = std::max(from.seconds, part_.first.ToDouble());
        double const last = std::min(to.seconds, part_.last.ToDouble());
        if (before.out == KFS_Interp_Hold || key.in == KFS_Interp_Hold) {
            bool const jumps = key.time <= part_.last;
            samples_.segments.push_back({{from.place, jumps ? to.place : from.place}, true});
            samples_.speed.push_back({first, 0.0});
            samples_.speed.push_back({last, 0.0});
            return;
        }
        bool const isWhole = before.time >= part_.first && key.time <= part_.last;
        samples_.segments.push_back({isWhole ? Route(from, to) : PartOfRoute(before.time, key.time), false});
        bool const isLinear = before.out == KFS_Interp_Linear && key.in == KFS_Interp_Linear;
        std::int64_t const wanted = static_cast<std::int64_t>((last - first) * pointsPerSecond);
        AddSpeed(before.time, key.time, index, isLinear ? 1 : std::clamp(wanted, std::int64_t{24}, std::int64_t{4000}));
    }

    // What of a segment is to be seen, point after point in time.
    std::vector<Place> PartOfRoute(Rational const& start, Rational const& end) const
    {
        constexpr std::int64_t pieces = 96;
        Rational const first = std::max(start, part_.first);
        Rational const step = (std::min(end, part_.last) - first) * Rational(1, pieces);
        std::vector<Place> route;
        for (std::int64_t i = 0; i <= pieces; ++i) route.push_back(Read(first + step * Rational(i, 1)));
        return route;
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

    // On the way to the key at `index`. Where it ends there the speed is the one before that key.
    void AddSpeed(Rational const& startTime, Rational const& endTime, int index, std::int64_t pieces)
    {
        unsigned int const scale = stream_.GetTimeScale();
        int const start = startTime.ToUnits(scale);
        int const end = endTime.ToUnits(scale);
        std::int64_t const from = std::max(start, part_.first.ToUnits(scale));
        std::int64_t const length = std::min(end, part_.last.ToUnits(scale)) - from;
        pieces = std::min(pieces, length);
        for (std::int64_t i = 0; i <= pieces; ++i) {
            std::int64_t const time = from + (pieces == 0 ? 0 : length * i / pieces);
            double speed = 0.0;
            if (time == end)
                ReadRateInto(stream_, index, &speed);
            else
                ReadRate(stream_, static_cast<int>(time), &speed);
            samples_.speed.push_back({static_cast<double>(time) / scale, speed});
        }
    }

    StreamItem const& item_;
    KFS_Stream const& stream_;
    std::array<std::size_t, 3> axes_;
    TimeSpan part_;
    MotionSamples samples_;
};

}  // namespace

MotionSamples SampleMotion(StreamItem const& item, TimeSpan const& part, double pointsPerSecond)
{
    return Sampler(item).Run(part, pointsPerSecond);
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
