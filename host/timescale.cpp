#include "host/timescale.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <stdexcept>

namespace kfshost {

namespace {

// 120000 makes whole numbers of the frames of all common rates, 30000/1001 and 60000/1001 included, and lasts for two
// hours and a half. The divisors of it behind are for longer times. Then come scales for 72, 90 and 144 frames a second
// and for decimals of up to eight places, with the common frames in them where that leaves room.
constexpr std::array<unsigned int, 11> WellKnown{120000,  30000,   24000,    6000,     600,      360000,
                                                 1000000, 3000000, 10000000, 30000000, 100000000};

bool Fits(double seconds, unsigned int scale)
{
    return std::abs(std::round(seconds * scale)) <= MaxKeyUnits;
}

// A product of a 32-bit float and a 32-bit scale is good to far less than half a unit within MaxKeyUnits.
double NearestTime(float time, unsigned int scale)
{
    return std::round(static_cast<double>(time) * scale) / scale;
}

bool IsExact(float time, unsigned int scale)
{
    return static_cast<float>(NearestTime(time, scale)) == time;
}

double Longest(std::span<float const> times)
{
    double longest = 0.0;
    for (float const time : times) longest = std::max(longest, std::abs(static_cast<double>(time)));
    return longest;
}

unsigned int FinestPowerOfTwo(double longest)
{
    for (int power = 30; power >= 0; --power) {
        unsigned int const scale = 1U << power;
        if (Fits(longest, scale)) return scale;
    }
    throw std::range_error("a time that is too long for a 32-bit time line");
}

}  // namespace

int ToUnits(float time, unsigned int scale)
{
    return static_cast<int>(std::round(static_cast<double>(time) * scale));
}

TimeScale JudgeTimeScale(std::span<float const> times, unsigned int scale)
{
    if (scale == 0 || !Fits(Longest(times), scale))
        throw std::range_error("a time that doesn't fit a 32-bit time line of that scale");
    TimeScale result{scale, true, 0.0};
    for (float const time : times) {
        result.exact = result.exact && IsExact(time, scale);
        result.worstError = std::max(result.worstError, std::abs(NearestTime(time, scale) - time));
    }
    return result;
}

TimeScale ChooseTimeScale(std::span<float const> times)
{
    double const longest = Longest(times);
    for (unsigned int const scale : WellKnown)
        if (Fits(longest, scale) && std::ranges::all_of(times, [&](float time) { return IsExact(time, scale); }))
            return JudgeTimeScale(times, scale);
    return JudgeTimeScale(times, FinestPowerOfTwo(longest));
}

}  // namespace kfshost
