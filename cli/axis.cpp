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
{
    double const largest = std::max(std::abs(low_), std::abs(high_));
    if (largest >= 1e6 || (largest > 0.0 && largest < 1e-3))
        exponent_ = 3 * static_cast<int>(std::floor(std::log10(largest) / 3));
}

Axis Axis::Around(double number)
{
    double const half = number == 0.0 ? 1.0 : std::abs(number) / 2;
    Axis axis(number - half, number + half, 1);
    axis.number_ = number;
    axis.exponent_ = 0;
    return axis;
}

std::vector<double> Axis::Ticks() const
{
    if (number_) return {*number_};
    std::vector<double> ticks;
    for (double index = std::ceil(low_ / step_); index * step_ <= high_; index += 1.0) ticks.push_back(index * step_);
    return ticks;
}

bool Axis::IsZero(double tick) const
{
    return std::abs(tick) < (number_ ? high_ - low_ : step_) / 2;
}

std::string Axis::Label(double tick) const
{
    if (number_) return fmt::format("{:.6g}", tick == 0.0 ? 0.0 : tick);
    double const power = std::pow(10.0, exponent_);
    int const places = std::clamp(static_cast<int>(std::ceil(-std::log10(step_ / power) - 1e-9)), 0, 15);
    return fmt::format("{:.{}f}", IsZero(tick) ? 0.0 : tick / power, places);
}

std::string Axis::Factor() const
{
    return exponent_ == 0 ? "" : fmt::format("1e{}", exponent_);
}

Range WithAir(Range range, double share, double leastExtent)
{
    double const middle = (range.low + range.high) / 2;
    double const extent = std::max(range.high - range.low, leastExtent) * (0.5 + share);
    return {middle - extent, middle + extent};
}
