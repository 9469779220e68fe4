#include "cli/axis.h"

#include <fmt/format.h>

#include <algorithm>
#include <cmath>

namespace {

double RoundStep(double raw)
{
    double const power = std::pow(10.0, std::floor(std::log10(raw)));
    double const mantissa = raw / power;
    return power * (mantissa <= 1.0 ? 1.0 : mantissa <= 2.0 ? 2.0 : mantissa <= 5.0 ? 5.0 : 10.0);
}

}  // namespace

Axis::Axis(double low, double high, int ticks, double leastStep)
    : low_(low),
      high_(high),
      step_(std::max(RoundStep((high - low) / ticks), leastStep))
{}

std::vector<double> Axis::Ticks() const
{
    std::vector<double> ticks;
    for (double index = std::ceil(low_ / step_); index * step_ <= high_; index += 1.0) ticks.push_back(index * step_);
    return ticks;
}

std::string Axis::Label(double tick) const
{
    double const largest = std::max(std::abs(low_), std::abs(high_));
    if (largest >= 1e6 || step_ < 1e-5) {
        return std::abs(tick) < step_ / 2
                   ? "0"
                   : fmt::format("{:.{}e}", tick,
                                 std::clamp(static_cast<int>(std::ceil(std::log10(largest / step_))), 0, 15));
    }
    int const places = std::max(0, static_cast<int>(std::ceil(-std::log10(step_) - 1e-9)));
    return fmt::format("{:.{}f}", std::abs(tick) < step_ / 2 ? 0.0 : tick, places);
}

Range WithAir(Range range, double share, double leastExtent)
{
    double const middle = (range.low + range.high) / 2;
    double const extent = std::max(range.high - range.low, leastExtent) * (0.5 + share);
    return {middle - extent, middle + extent};
}
