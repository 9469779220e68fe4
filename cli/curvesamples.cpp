#include "cli/curvesamples.h"

#include "curves/tangents.h"
#include "host/storeerror.h"
#include "keystore/evaluate.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <cstdint>

using kfshost::ThrowIfFailed;

namespace {

// One sampler walks a stream from key to key. Times are whole units of the stream's scale, as its keys are.
class Sampler {
public:
    Sampler(KFS_Stream const& stream, double pointsPerSecond)
        : stream_(stream),
          dimension_(static_cast<std::size_t>(stream.GetDimension())),
          scale_(stream.GetTimeScale()),
          pointsPerSecond_(pointsPerSecond),
          row_(dimension_),
          nextRow_(dimension_)
    {
        curves_.components.resize(dimension_);
    }

    StreamCurves Run()
    {
        int const keys = kfshost::KeyCount(stream_);
        for (int i = 0; i < keys; ++i) {
            AddKey(i);
            if (i + 1 < keys) AddSegment(i);
        }
        return std::move(curves_);
    }

private:
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
    }

    void AddKey(int index)
    {
        char inInterp = 0;
        char outInterp = 0;
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, row_.data(), &inInterp, &outInterp));
        double const seconds = Seconds(KeyUnits(index));
        for (std::size_t d = 0; d < dimension_; ++d) {
            Point const key{seconds, row_[d]};
            curves_.components[d].keys.push_back(key);
            curves_.components[d].value.push_back(key);
        }
        if (!stream_.IsSpatial())  // a path's handles belong to the graph of its distance, not to these
            AddHandles(index, seconds, inInterp, outInterp);
    }

    void AddHandles(int index, double seconds, char inInterp, char outInterp)
    {
        std::vector<double> inX(dimension_), inY(dimension_), outX(dimension_), outY(dimension_);
        ThrowIfFailed(KFS_GetKeyTangentsF(&stream_, index, inX.data(), inY.data(), outX.data(), outY.data()));
        for (std::size_t d = 0; d < dimension_; ++d) {
            Point const key{seconds, row_[d]};
            if (inInterp == KFS_Interp_Spline && inX[d] < 0.0)
                curves_.handles.push_back({d, key, {key.x + inX[d], key.y + inY[d]}});
            if (outInterp == KFS_Interp_Spline && outX[d] > 0.0)
                curves_.handles.push_back({d, key, {key.x + outX[d], key.y + outY[d]}});
        }
    }

    void AddSegment(int index)
    {
        int const start = KeyUnits(index);
        int const end = KeyUnits(index + 1);
        char outInterp = 0;
        char inInterp = 0;
        ThrowIfFailed(KFS_GetKeyF(&stream_, index, nullptr, nullptr, &outInterp));
        ThrowIfFailed(KFS_GetKeyF(&stream_, index + 1, nullptr, &inInterp, nullptr));
        if (outInterp == KFS_Interp_Hold || inInterp == KFS_Interp_Hold) {
            AddHold(start, end);
        } else if (outInterp == KFS_Interp_Linear && inInterp == KFS_Interp_Linear) {
            AddPieces(start, end, 1);
        } else {
            double const wanted = (static_cast<double>(end) - start) / scale_ * pointsPerSecond_;
            AddPieces(start, end, std::clamp(static_cast<std::int64_t>(wanted), std::int64_t{24}, std::int64_t{4000}));
        }
    }

    void AddHold(int start, int end)
    {
        Read(start, row_);
        for (std::size_t d = 0; d < dimension_; ++d) {
            ComponentCurve& curve = curves_.components[d];
            curve.value.push_back({Seconds(end), row_[d]});
            curve.speed.push_back({Seconds(start), 0.0});
            curve.speed.push_back({Seconds(end), 0.0});
        }
    }

    // The speed in the middle of a piece is the slope across it; at the segment's ends that of the outermost pieces
    // stands for the limit.
    void AddPieces(int start, int end, std::int64_t pieces)
    {
        std::int64_t const length = std::int64_t{end} - start;
        pieces = std::min(pieces, length);
        Read(start, row_);
        std::int64_t before = start;
        for (std::int64_t i = 1; i <= pieces; ++i) {
            std::int64_t const after = start + length * i / pieces;
            Read(static_cast<int>(after), nextRow_);
            for (std::size_t d = 0; d < dimension_; ++d) {
                ComponentCurve& curve = curves_.components[d];
                double const slope = (nextRow_[d] - row_[d]) / Seconds(after - before);
                if (i == 1) curve.speed.push_back({Seconds(start), slope});
                curve.speed.push_back({(Seconds(before) + Seconds(after)) / 2, slope});
                if (i == pieces) curve.speed.push_back({Seconds(end), slope});
                curve.value.push_back({Seconds(after), nextRow_[d]});
            }
            before = after;
            std::swap(row_, nextRow_);
        }
    }

    KFS_Stream const& stream_;
    std::size_t dimension_;
    unsigned int scale_;
    double pointsPerSecond_;
    std::vector<double> row_;
    std::vector<double> nextRow_;
    StreamCurves curves_;
};

}  // namespace

StreamCurves SampleCurves(kfshost::StreamItem const& item, double pointsPerSecond)
{
    return Sampler(*item.stream, pointsPerSecond).Run();
}
