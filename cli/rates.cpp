// What the library answers of rates, as components of what is shown.
#include "cli/rates.h"

#include "curves/derivatives.h"
#include "curves/spacetangents.h"
#include "curves/tangents.h"
#include "host/paths.h"
#include "host/rotations.h"
#include "host/storeerror.h"
#include "keystore/evaluate.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>

using kfshost::ThrowIfFailed;

namespace {

T_Time TimeOf(KFS_Stream const& stream, int index)
{
    T_Time time{};
    ThrowIfFailed(KFS_IndexToTime(&stream, index, &time));
    return time;
}

double Greatest(std::vector<double> const& numbers)
{
    double greatest = 0.0;
    for (double const number : numbers) greatest = std::max(greatest, std::abs(number));
    return greatest;
}

// The peak of a graph above 0, or what is drawn of it. `sign` -1 looks at what is below.
double PeakInSight(std::vector<Point> const& graph, double sign)
{
    constexpr double briefly = 0.004;  // of the time: five columns of pixels
    constexpr double tooHigh = 4.0;
    struct Piece {
        double rate;  // that it doesn't go below
        double seconds;
    };
    std::vector<Piece> pieces;
    double peak = 0.0;
    double brief = graph.empty() ? 0.0 : briefly * (graph.back().x - graph.front().x);
    for (std::size_t i = 0; i < graph.size(); ++i) {
        peak = std::max(peak, sign * graph[i].y);
        if (i > 0) pieces.push_back({std::min(sign * graph[i - 1].y, sign * graph[i].y), graph[i].x - graph[i - 1].x});
    }
    std::ranges::sort(pieces, std::ranges::greater{}, &Piece::rate);
    auto const usual =
        std::ranges::find_if(pieces, [&brief](Piece const& piece) { return (brief -= piece.seconds) < 0; });
    if (usual == pieces.end() || usual->rate <= 0.0 || peak <= tooHigh * usual->rate) return peak;
    return tooHigh / 2 * usual->rate;
}

}  // namespace

Range RatesInSight(std::vector<Point> const& graph)
{
    return {-PeakInSight(graph, -1.0), PeakInSight(graph, 1.0)};
}

// A stream with separated dimensions has the rates of those.
void ReadRate(KFS_Stream const& stream, int time, double* rate)
{
    T_Time const at{time, stream.GetTimeScale()};
    for (KFS_Stream const* mover : kfshost::MoversOf(stream))
        ThrowIfFailed(KFS_GetDeriv(mover, &at, KFS_Deriv_Velocity, 0, 0, rate++, nullptr, nullptr, {}, {}));
}

void ReadRateInto(KFS_Stream const& stream, int index, double* rate)
{
    if (stream.IsSpatial() && kfshost::IsFloatKey(stream, index))
        ReadRate(stream, TimeOf(stream, index).value, rate);  // it has no speed of its own
    else
        ThrowIfFailed(KFS_GetKeyVelocityF(&stream, index, 1, rate, nullptr));
}

Rates::Rates(KFS_Stream const& stream, bool asRotation)
    : stream_(stream),
      asRotation_(asRotation),
      rate_(static_cast<std::size_t>(stream.GetDimension()))
{}

std::vector<double> const& Rates::At(int time)
{
    T_Time const at{time, stream_.GetTimeScale()};
    ReadRate(stream_, time, rate_.data());
    if (stream_.IsSpatial() && !kfshost::IsSeparated(stream_)) {
        std::vector<double> way(rate_.size());
        ThrowIfFailed(KFS_GetSpaceTangent(&stream_, &at, 0, 0, way.data(), nullptr, nullptr));
        GoAlong(way);
    }
    if (asRotation_) FinishRotation(at);
    return rate_;
}

std::vector<double> const& Rates::Into(int index)
{
    std::ranges::fill(rate_, 0.0);
    if (index == 0) return rate_;
    ReadRateInto(stream_, index, rate_.data());
    if (stream_.IsSpatial()) GoAlong(WayInto(index));
    if (asRotation_) FinishRotation(TimeOf(stream_, index));
    return rate_;
}

// Of q / |q| the rate is that of q without its part along q, over |q|.
void Rates::FinishRotation(T_Time const& at)
{
    std::vector<double> unit(rate_.size());
    ThrowIfFailed(KFS_GetValueFPlus(&stream_, &at, 0, unit.data(), nullptr, nullptr));
    double const first = Greatest(unit);
    kfshost::Normalise(unit.data());
    if (Greatest(unit) == 0.0) return;
    double const length = first / Greatest(unit);
    double along = 0.0;
    for (std::size_t i = 0; i < unit.size(); ++i) along += unit[i] * rate_[i];
    for (std::size_t i = 0; i < unit.size(); ++i) rate_[i] = (rate_[i] - along * unit[i]) / length;
}

// The speed, which stands in front, along a direction of any size.
void Rates::GoAlong(std::vector<double> const& way)
{
    double const speed = rate_.front();
    double const greatest = Greatest(way);
    double squares = 0.0;
    for (double const step : way) squares += step / greatest * (step / greatest);
    for (std::size_t i = 0; i < way.size(); ++i)
        rate_[i] = greatest > 0.0 ? speed * (way[i] / greatest / std::sqrt(squares)) : 0.0;
}

// The way a path comes to a key: from where the arc's last handle ends.
std::vector<double> Rates::WayInto(int index) const
{
    std::vector<double> way(rate_.size()), from(way), to(way), out(way);
    ThrowIfFailed(KFS_GetKeySpaceTangentsF(&stream_, index, -1, way.data(), nullptr));
    for (double& step : way) step = -step;
    if (Greatest(way) > 0.0) return way;
    ThrowIfFailed(KFS_GetKeyF(&stream_, index - 1, from.data(), nullptr, nullptr));
    ThrowIfFailed(KFS_GetKeyF(&stream_, index, to.data(), nullptr, nullptr));
    ThrowIfFailed(KFS_GetKeySpaceTangentsF(&stream_, index - 1, -1, nullptr, out.data()));
    for (std::size_t i = 0; i < way.size(); ++i) way[i] = to[i] - (from[i] + out[i]);
    return way;
}
