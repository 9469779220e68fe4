#include "host/polyline.h"

#include "curves/adaptivesamples.h"
#include "host/scene.h"
#include "host/storeerror.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>
#include <optional>

namespace kfshost {

namespace {

constexpr std::size_t MostPoints = 1'000'000;
constexpr int TooMany = 1;  // what the test below answers, which the library hands through

class NeverAbort final : public KFS_AbortChecker {
public:
    int CheckAbort() const override { return 0; }
};

class ScSamples {
public:
    ScSamples() { ThrowIfFailed(SEQ_New(0, sizeof(PolylinePoint), 4, 1, &stream.samples)); }
    ~ScSamples() { static_cast<void>(SEQ_Dispose(stream.samples, 0)); }
    ScSamples(ScSamples const&) = delete;
    ScSamples& operator=(ScSamples const&) = delete;

    std::vector<PolylinePoint> Points() const
    {
        std::vector<PolylinePoint> points(static_cast<std::size_t>((*stream.samples)->count));
        for (std::size_t i = 0; i < points.size(); ++i) {
            void const* item = nullptr;
            ThrowIfFailed(SEQ_GetConstAddress(stream.samples, static_cast<int>(i), &item));
            points[i] = *static_cast<PolylinePoint const*>(item);
        }
        return points;
    }

    KFS_AdaptiveSampleStream stream;
};

struct Test {
    double tolerance;
    std::size_t left = MostPoints;
};

// The value of the polynomial form in three variables that belongs to a cubic with these control values.
double Blossom(double const (&d)[4], double u, double v, double w)
{
    auto const between = [](double a, double b, double t) { return a + (b - a) * t; };
    double const e[3] = {between(d[0], d[1], u), between(d[1], d[2], u), between(d[2], d[3], u)};
    return between(between(e[0], e[1], v), between(e[1], e[2], v), w);
}

// How far the curve lies above its chord is a cubic too, 0 at both ends of the stretch. Between them it is at most three
// quarters of the greater of its two inner control values.
int DivideWhereItBends(void* refCon, unsigned int, double t0, double t1, double* start, double* end,
                       CRV_Curve const* curve, unsigned char* divide)
{
    auto& test = *static_cast<Test*>(refCon);
    double const width = end[0] - start[0];
    if (width == 0.0) return 0;  // upright
    double const slope = (end[1] - start[1]) / width;
    double const* const points[] = {curve->p0, curve->p1, curve->p2, curve->p3};
    double above[4];
    double size = 0.0;
    for (int i = 0; i < 4; ++i) {
        above[i] = points[i][1] - start[1] - slope * (points[i][0] - start[0]);
        size = std::max(size, std::abs(points[i][1]));
    }
    double const bend = std::max(std::abs(Blossom(above, t0, t0, t1)), std::abs(Blossom(above, t0, t1, t1)));
    double const rounding = 16 * std::numeric_limits<double>::epsilon() * size;
    *divide = width < 0.0 || !(0.75 * bend <= std::max(test.tolerance, rounding)) ? 1 : 0;
    return *divide != 0 && test.left-- == 0 ? TooMany : 0;
}

class Sampler {
public:
    Sampler(KFS_Stream const& stream, int component, double tolerance)
        : stream_(stream),
          component_(component),
          row_(static_cast<std::size_t>(stream.GetDimension())),
          test_{tolerance}
    {}

    std::vector<PolylinePoint> Run(std::int64_t from, std::int64_t to)
    {
        std::vector<PolylinePoint> points = Sample(from, to);
        if (stream_.HasActiveExpression()) return points;
        if (auto const key = KeyAt(to)) EndAtKey(points, {static_cast<double>(to) / stream_.GetTimeScale(), *key});
        // Where the line begins with a jump it begins behind it.
        auto const isLater = [&](PolylinePoint const& point) { return point.seconds > points.front().seconds; };
        points.erase(points.begin(), std::ranges::find_if(points, isLater) - 1);
        BeginAtFirstKey(points, from, to);
        return points;
    }

private:
    // The value of the key exactly at a time.
    std::optional<double> KeyAt(std::int64_t units)
    {
        T_Time const time{static_cast<int>(units), stream_.GetTimeScale()};
        int index = KFS_INVALID_INDEX;
        ThrowIfFailed(KFS_TimeToIndex(&stream_, &time, &index));
        if (index == KFS_INVALID_INDEX) return std::nullopt;
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, row_.data(), nullptr, nullptr));
        return row_[static_cast<std::size_t>(component_)];
    }

    // Before the first key its value holds, also where the line jumps away from it at once.
    void BeginAtFirstKey(std::vector<PolylinePoint>& points, std::int64_t from, std::int64_t to)
    {
        T_Time first{};
        ThrowIfFailed(KFS_IndexToTime(&stream_, 0, &first));
        if (first.value <= from || first.value > to) return;
        PolylinePoint const key{static_cast<double>(first.value) / stream_.GetTimeScale(), *KeyAt(first.value)};
        if (points.front().value != key.value) points.insert(points.begin(), key);
    }

    // The library ends before a jump, reads behind it. But its end is a sum of seconds, which may come out a bit behind the
    // key: then what it has of the next segment is cut off.
    static void EndAtKey(std::vector<PolylinePoint>& points, PolylinePoint const& key)
    {
        while (points.size() > 1 && points.back().seconds > key.seconds) points.pop_back();
        auto const isKey = [&](PolylinePoint const& point) {
            return point.seconds == key.seconds && point.value == key.value;
        };
        auto const last = std::find_if(points.rbegin(), points.rend(), isKey);
        if (last != points.rend())
            points.erase(last.base(), points.end());
        else
            points.push_back(key);
    }

    std::vector<PolylinePoint> Sample(std::int64_t from, std::int64_t to)
    {
        constexpr std::int64_t longest = std::numeric_limits<int>::max();
        unsigned int const scale = stream_.GetTimeScale();
        ScSamples samples;
        // A span may be longer than a duration can be.
        for (std::int64_t start = from;; start += longest) {
            T_Time const begin{static_cast<int>(start), scale};
            T_Time const duration{static_cast<int>(std::min(to - start, longest)), scale};
            double least = 0.0;
            double greatest = 0.0;
            int const code = KFS_GetAdaptiveSampleStream(
                static_cast<short>(component_), const_cast<KFS_Stream*>(&stream_), &begin, &duration, nullptr, nullptr,
                &DivideWhereItBends, &test_, &samples.stream, &least, &greatest, NeverAbort());
            if (code == TooMany && test_.left > MostPoints) throw PolylineError("asks for more than a million points");
            ThrowIfFailed(code);
            if (to - start <= longest) return samples.Points();
        }
    }

    KFS_Stream const& stream_;
    int component_;
    std::vector<double> row_;
    Test test_;
};

}  // namespace

std::vector<PolylinePoint> SamplePolyline(KFS_Stream const& stream, int component, Rational const& from,
                                          Rational const& to, double tolerance)
{
    if (stream.GetKeyCount() == 0) return {};
    unsigned int const scale = stream.GetTimeScale();
    if (stream.HasNoKeys() && !stream.HasActiveExpression()) {
        std::vector<double> row(static_cast<std::size_t>(stream.GetDimension()));
        ReadAt(stream, from, row.data());
        return {{from.ToDouble(), row[static_cast<std::size_t>(component)]}};
    }
    return Sampler(stream, component, tolerance).Run(from.ToUnits(scale), to.ToUnits(scale));
}

}  // namespace kfshost
