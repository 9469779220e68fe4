#include "cli/curvesamples.h"

#include "cli/axis.h"
#include "cli/rates.h"
#include "curves/tangents.h"
#include "host/polyline.h"
#include "host/rotations.h"
#include "host/storeerror.h"
#include "keystore/evaluate.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <cstdint>
#include <limits>

using kfshost::Rational;
using kfshost::ThrowIfFailed;

namespace {

// How far a line may be from its curve, as a share of what it extends over: a fraction of what can be seen.
constexpr double ToleratedShare = 1.0 / 2000;
// The least share of the handles' extent that is looked at closely.
constexpr double LeastShare = 1e-9;

// One sampler walks a stream from key to key. Times are whole units of the stream's scale, as its keys are.
//
// Values of plain streams are lines with as few points as they need. What the library has no line for is read at regular
// times: rates; expressions; paths, whose components follow from their distance; and rotations, of which it takes what the quaternion
// stands for, of length 1, as all that is shown of one.
class Sampler {
public:
    Sampler(KFS_Stream const& stream, bool isRotation, std::vector<std::size_t> const& components, TimeSpan const& part,
            double pointsPerSecond)
        : stream_(stream),
          isRotation_(isRotation),
          components_(components),
          scale_(stream_.GetTimeScale()),
          first_(part.first.ToUnits(scale_)),
          last_(part.last.ToUnits(scale_)),
          pointsPerSecond_(pointsPerSecond),
          row_(static_cast<std::size_t>(stream_.GetDimension())),
          rates_(stream_, isRotation_)
    {
        curves_.components.resize(components.size());
        extents_.resize(row_.size(), {HUGE_VAL, -HUGE_VAL});
    }

    // The value that an expression computes has neither keys nor handles.
    StreamCurves RunExpression()
    {
        double const wanted = (static_cast<double>(last_) - first_) / scale_ * pointsPerSecond_;
        std::int64_t const pieces = std::clamp(static_cast<std::int64_t>(wanted), std::int64_t{96}, std::int64_t{4000});
        AddPieces(first_, last_, pieces, NoKey);
        return std::move(curves_);
    }

    StreamCurves Run()
    {
        int const keys = kfshost::KeyCount(stream_);
        for (int i = 0; i < keys; ++i) {
            int const time = KeyUnits(i);
            if (time >= first_ && time <= last_) AddKey(i, time);
            if (i + 1 < keys && time < last_ && KeyUnits(i + 1) > first_) AddSegment(i, time, KeyUnits(i + 1));
        }
        for (std::size_t c = 0; HasLines() && c < components_.size(); ++c)
            curves_.components[c].value = LineOf(components_[c]);
        return std::move(curves_);
    }

private:
    static constexpr int NoKey = -1;

    bool HasLines() const { return !stream_.IsSpatial() && !isRotation_ && !stream_.HasActiveExpression(); }

    // Ever finer until it is fine enough for what it turns out to extend over.
    std::vector<Point> LineOf(std::size_t d) const
    {
        double const extent = extents_[d].high - extents_[d].low;
        if (!std::isfinite(extent)) return {{Seconds(first_), extents_[d].low}, {Seconds(last_), extents_[d].high}};
        double const finest = std::max(extent * LeastShare, std::numeric_limits<double>::min());
        double tolerance = std::max(extent * ToleratedShare, finest);
        for (;;) {
            auto const points = kfshost::SamplePolyline(stream_, static_cast<int>(d), Rational(first_, scale_),
                                                        Rational(last_, scale_), tolerance);
            std::vector<Point> line;
            Range range{HUGE_VAL, -HUGE_VAL};
            for (kfshost::PolylinePoint const& point : points) {
                line.push_back({point.seconds, point.value});
                range = {std::min(range.low, point.value), std::max(range.high, point.value)};
            }
            double const needed = std::max((range.high - range.low) * ToleratedShare, finest);
            if (!(2 * needed < tolerance)) return line;
            tolerance = needed;
        }
    }

    // A point of a key or of one of its handles.
    void Include(std::size_t d, double y)
    {
        extents_[d] = {std::min(extents_[d].low, y), std::max(extents_[d].high, y)};
    }

    double Seconds(std::int64_t units) const { return static_cast<double>(units) / scale_; }

    int KeyUnits(int index) const
    {
        T_Time time{};
        ThrowIfFailed(KFS_IndexToTime(&stream_, index, &time));
        return time.value;
    }

    void Read(int units, std::vector<double>& row) const
    {
        T_Time const time{units, scale_};
        ThrowIfFailed(KFS_GetValueFPlus(&stream_, &time, 0, row.data(), nullptr, nullptr));
        if (isRotation_) kfshost::Normalise(row.data());
    }

    void AddKey(int index, int time)
    {
        char inInterp = 0;
        char outInterp = 0;
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, row_.data(), &inInterp, &outInterp));
        if (isRotation_) kfshost::Normalise(row_.data());
        double const seconds = Seconds(time);
        for (std::size_t c = 0; c < components_.size(); ++c) {
            Point const key{seconds, row_[components_[c]]};
            curves_.components[c].keys.push_back(key);
            if (HasLines())
                Include(components_[c], key.y);
            else
                curves_.components[c].value.push_back(key);
        }
        // A path's handles belong to the graph of its distance, a rotation's to its stored components, not to these.
        if (HasLines()) AddHandles(index, seconds, inInterp, outInterp);
    }

    // Those whose ends lie in the part that is drawn.
    void AddHandles(int index, double seconds, char inInterp, char outInterp)
    {
        std::size_t const dimension = row_.size();
        std::vector<double> inX(dimension), inY(dimension), outX(dimension), outY(dimension);
        ThrowIfFailed(KFS_GetKeyTangentsF(&stream_, index, inX.data(), inY.data(), outX.data(), outY.data()));
        for (std::size_t c = 0; c < components_.size(); ++c) {
            std::size_t const d = components_[c];
            Point const key{seconds, row_[d]};
            if (inInterp == KFS_Interp_Spline && inX[d] < 0.0 && key.x + inX[d] >= Seconds(first_))
                curves_.handles.push_back({c, key, {key.x + inX[d], key.y + inY[d]}});
            if (outInterp == KFS_Interp_Spline && outX[d] > 0.0 && key.x + outX[d] <= Seconds(last_))
                curves_.handles.push_back({c, key, {key.x + outX[d], key.y + outY[d]}});
        }
    }

    // The ends of a segment with the handles between them: what is between lies there as well.
    void IncludeSegment(int index)
    {
        std::size_t const dimension = row_.size();
        std::vector<double> x(dimension), y(dimension);
        for (int const key : {index, index + 1}) {
            ThrowIfFailed(KFS_GetKeyF(&stream_, key, row_.data(), nullptr, nullptr));
            double* const none = nullptr;
            bool const out = key == index;
            ThrowIfFailed(KFS_GetKeyTangentsF(&stream_, key, out ? none : x.data(), out ? none : y.data(),
                                              out ? x.data() : none, out ? y.data() : none));
            for (std::size_t d = 0; d < dimension; ++d)
                for (double const value : {row_[d], row_[d] + y[d]}) Include(d, value);
        }
    }

    void AddSegment(int index, int start, int end)
    {
        if (HasLines()) IncludeSegment(index);
        char outInterp = 0;
        char inInterp = 0;
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, nullptr, nullptr, &outInterp));
        ThrowIfFailed(KFS_GetKeyF(&stream_, index + 1, nullptr, &inInterp, nullptr));
        int const from = std::max(start, first_);
        int const to = std::min(end, last_);
        bool const isLinear = outInterp == KFS_Interp_Linear && inInterp == KFS_Interp_Linear;
        if (outInterp == KFS_Interp_Hold || inInterp == KFS_Interp_Hold) {
            AddHold(from, to);
        } else if (isLinear && !isRotation_) {
            AddPieces(from, to, 1, index);
        } else {
            double const wanted = (static_cast<double>(to) - from) / scale_ * pointsPerSecond_;
            std::int64_t const least = isLinear ? 1 : 24;  // the arc of a rotation bends little
            AddPieces(from, to, std::clamp(static_cast<std::int64_t>(wanted), least, std::int64_t{4000}), index);
        }
    }

    void AddHold(int from, int to)
    {
        Read(from, row_);
        for (std::size_t c = 0; c < components_.size(); ++c) {
            ComponentCurve& curve = curves_.components[c];
            for (int const time : {from, to}) {
                if (!HasLines()) curve.value.push_back({Seconds(time), row_[components_[c]]});
                curve.speed.push_back({Seconds(time), 0.0});
            }
        }
    }

    // A part of the segment behind a key. Where it ends in the next one the rate is the one before that.
    void AddPieces(int from, int to, std::int64_t pieces, int index)
    {
        bool const endsInKey = index != NoKey && to == KeyUnits(index + 1);
        std::int64_t const length = std::int64_t{to} - from;
        pieces = std::min(pieces, length);
        for (std::int64_t i = 0; i <= pieces; ++i) {
            int const time = static_cast<int>(from + (pieces == 0 ? 0 : length * i / pieces));
            std::vector<double> const& rates = endsInKey && time == to ? rates_.Into(index + 1) : rates_.At(time);
            if (!HasLines()) Read(time, row_);
            for (std::size_t c = 0; c < components_.size(); ++c) {
                ComponentCurve& curve = curves_.components[c];
                if (!HasLines()) curve.value.push_back({Seconds(time), row_[components_[c]]});
                curve.speed.push_back({Seconds(time), rates[components_[c]]});
            }
        }
    }

    KFS_Stream const& stream_;
    bool isRotation_;
    std::vector<std::size_t> const& components_;
    unsigned int scale_;
    int first_;
    int last_;
    double pointsPerSecond_;
    std::vector<double> row_;
    Rates rates_;
    std::vector<Range> extents_;  // of what bounds each component's curve
    StreamCurves curves_;
};

StreamCurves Run(Sampler sampler, KFS_Stream const& stream)
{
    return stream.HasActiveExpression() ? sampler.RunExpression() : sampler.Run();
}

// Each component by the keys of its own stream.
StreamCurves SampleSeparated(KFS_Stream const& leader, std::vector<std::size_t> const& components, TimeSpan const& part,
                             double pointsPerSecond)
{
    std::vector<KFS_Stream const*> const followers = kfshost::MoversOf(leader);
    StreamCurves curves;
    for (std::size_t c = 0; c < components.size(); ++c) {
        StreamCurves one =
            Run({*followers[components[c]], false, {0}, part, pointsPerSecond}, *followers[components[c]]);
        curves.components.push_back(std::move(one.components.front()));
        for (Handle const& handle : one.handles) curves.handles.push_back({c, handle.key, handle.end});
    }
    return curves;
}

}  // namespace

StreamCurves SampleCurves(kfshost::StreamItem const& item, std::vector<std::size_t> const& components,
                          TimeSpan const& part, double pointsPerSecond)
{
    if (kfshost::IsSeparated(*item.stream)) return SampleSeparated(*item.stream, components, part, pointsPerSecond);
    return Run({*item.stream, kfshost::IsRotation(item), components, part, pointsPerSecond}, *item.stream);
}
