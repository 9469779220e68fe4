// Rates from values, in the one place that asks for differences.
#include "cli/rates.h"

#include "host/rotations.h"
#include "host/storeerror.h"
#include "keystore/evaluate.h"

#include <algorithm>
#include <cstdint>

Rates::Rates(KFS_Stream const& stream, bool asRotation)
    : stream_(stream),
      asRotation_(asRotation),
      before_(static_cast<std::size_t>(stream.GetDimension())),
      here_(before_),
      after_(before_),
      rate_(before_)
{}

void Rates::Read(std::int64_t time, std::vector<double>& row) const
{
    T_Time const at{static_cast<int>(time), stream_.GetTimeScale()};
    kfshost::ThrowIfFailed(KFS_GetValueFPlus(&stream_, &at, 0, row.data(), nullptr, nullptr));
    if (asRotation_) kfshost::Normalise(row.data());
}

// The derivative of the parabola through three values around the time, or beside it at the ends of the segment.
std::vector<double> const& Rates::At(int time, int start, int end)
{
    std::int64_t const length = std::int64_t{end} - start;
    // A float key lies up to half a unit beside the time that is stored for it.
    std::int64_t const inset = length >= 8 ? 1 : 0;
    std::int64_t const low = start + inset;
    std::int64_t const high = end - inset;
    std::int64_t const half = std::clamp<std::int64_t>(length / 256, 1, std::max<std::int64_t>((high - low) / 2, 1));
    std::int64_t const middle = std::clamp<std::int64_t>(time, low + half, std::max(low + half, high - half));
    bool const fits = middle + half <= high;  // else the segment has room for two values only
    std::int64_t const last = fits ? middle + half : high;
    Read(middle - half, before_);
    Read(last, after_);
    if (fits) Read(middle, here_);
    double const step = static_cast<double>(fits ? half : last - middle + half) / stream_.GetTimeScale();
    double const beside =
        fits ? static_cast<double>(std::clamp<std::int64_t>(time, low, high) - middle) / static_cast<double>(half)
             : 0.0;
    for (std::size_t d = 0; d < rate_.size(); ++d) {
        double const slope = fits ? (after_[d] - before_[d]) / 2 : after_[d] - before_[d];
        double const bend = fits ? before_[d] - 2 * here_[d] + after_[d] : 0.0;
        rate_[d] = (slope + bend * beside) / step;
    }
    return rate_;
}
