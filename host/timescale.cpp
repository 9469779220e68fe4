#include "host/timescale.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <cmath>
#include <limits>
#include <numeric>
#include <stdexcept>
#include <string>

namespace kfshost {

namespace {

// In 120000 the frames of all common rates are whole, 30000/1001 and 60000/1001 included; it lasts for two hours and a
// half. The divisors of it behind are for longer times. Its multiples hold 72, 90 and 144 frames a second, and decimals
// of up to eight places, and the common frames as well.
constexpr std::array<unsigned int, 9> WellKnown{120000, 30000, 24000, 6000, 600, 360000, 3000000, 30000000, 300000000};

// What a scale is a multiple of where none of those does: the frames of as many rates as fit.
constexpr std::array<unsigned int, 4> CommonFrames{120000, 24000, 1200, 1};

bool Fits(double seconds, double scale)
{
    return std::abs(std::round(seconds * scale)) <= MaxKeyUnits;
}

bool Holds(unsigned int scale, FrameRate const& rate)
{
    return std::uint64_t{scale} * static_cast<unsigned int>(rate.denominator) %
               static_cast<unsigned int>(rate.numerator) ==
           0;
}

double LastPlace(float time)
{
    float const magnitude = std::abs(time);
    return static_cast<double>(std::nextafter(magnitude, std::numeric_limits<float>::infinity())) - magnitude;
}

// The frame that a time is meant for. Late in a long animation floats lie so wide apart that nearly every one is near a
// frame; an eighth of a frame is the most that counts.
std::optional<double> FindFrame(float time, FrameRate const& rate)
{
    double const frame = std::round(static_cast<double>(time) * rate.numerator / rate.denominator);
    double const seconds = frame * rate.denominator / rate.numerator;
    double const most = std::min(FrameTolerance * LastPlace(time), rate.denominator / (8.0 * rate.numerator));
    if (std::abs(static_cast<double>(static_cast<float>(seconds)) - time) > most) return std::nullopt;
    return frame;
}

double Longest(std::span<float const> times)
{
    double longest = 0.0;
    for (float const time : times) longest = std::max(longest, std::abs(static_cast<double>(time)));
    return longest;
}

// How many of the times aren't frames of a rate; counting ends where it is too many.
std::size_t CountMisses(std::span<float const> times, FrameRate const& rate, std::size_t tooMany)
{
    std::size_t misses = 0;
    for (std::size_t i = 0; i < times.size() && misses < tooMany; ++i) misses += FindFrame(times[i], rate) ? 0 : 1;
    return misses;
}

std::optional<FrameRate> FindRate(std::span<float const> times)
{
    std::optional<FrameRate> best;
    std::size_t fewest = times.size() / 2 + 1;
    for (FrameRate const& rate : UsualRates) {
        std::size_t const misses = CountMisses(times, rate, fewest);
        if (misses >= fewest) continue;
        fewest = misses;
        best = rate;
    }
    return best;
}

// Whether the unit at which a time stands is what it was meant for.
bool IsExact(float time, TimeScale const& scale)
{
    if (scale.rate && Holds(scale.scale, *scale.rate) && FindFrame(time, *scale.rate)) return true;
    return static_cast<float>(static_cast<double>(scale.ToUnits(time)) / scale.scale) == time;
}

void Judge(std::span<float const> times, TimeScale& scale)
{
    for (float const time : times) {
        scale.exact = scale.exact && IsExact(time, scale);
        double const placed = static_cast<double>(scale.ToUnits(time)) / scale.scale;
        scale.worstError = std::max(scale.worstError, std::abs(placed - time));
    }
}

// The finest multiple of `step` that holds such a time; 0 if there is none.
unsigned int FinestMultiple(unsigned int step, double longest)
{
    double const most = longest > 1.0 ? MaxKeyUnits / longest : MaxKeyUnits;
    return static_cast<unsigned int>(most / step) * step;
}

unsigned int FinestScale(double longest)
{
    for (unsigned int const step : CommonFrames)
        if (unsigned int const scale = FinestMultiple(step, longest); scale != 0) return scale;
    return 0;
}

// ---- decimals

// A plain decimal without a sign: digits with a point and an exponent, as from_chars takes them.
std::optional<double> ParseNumber(std::string_view text)
{
    text.remove_prefix(text.starts_with('+') ? 1 : 0);
    double number = 0.0;
    auto const [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    bool const isWhole = error == std::errc() && end == text.data() + text.size();
    if (!isWhole || !std::isfinite(number) || number <= 0.0) return std::nullopt;
    return number;
}

int CountDigits(std::string_view text)
{
    int digits = 0;
    for (char const c : text.substr(0, text.find_first_of("eE")))
        digits += c >= '0' && c <= '9' && (digits > 0 || c != '0') ? 1 : 0;
    return digits;
}

// Whether `seconds`, with so many significant digits, become `number` when they are rounded to them or cut after them.
// Two digits are few: then only what is rounded counts, since 0.016 is as good for 16 ms.
bool IsSpelling(double number, double seconds, int digits)
{
    double const step = std::pow(10.0, std::floor(std::log10(seconds)) + 1 - std::min(digits, 15));
    double const below = seconds - number;
    return std::abs(below) <= step * 0.5000001 || (digits > 2 && below > 0.0 && below < step);
}

// So many frames of a rate may a decimal stand for: few digits are near some frame of nearly every rate.
double MostFrames(int digits)
{
    return digits < 2 ? 0.0 : digits == 2 ? 1.0 : digits < 6 ? 4.0 : 1000.0;
}

std::optional<Rational> FindSpelled(double number, int digits)
{
    for (FrameRate const& rate : UsualRates) {
        double const frames = std::round(number * rate.numerator / rate.denominator);
        if (frames < 1.0 || frames > 1000.0) continue;
        double const seconds = frames * rate.denominator / rate.numerator;
        bool const isNear = std::abs(number - seconds) <= FrameTolerance * LastPlace(static_cast<float>(seconds));
        if (isNear || (frames <= MostFrames(digits) && IsSpelling(number, seconds, digits)))
            return Rational(static_cast<std::int64_t>(frames) * rate.denominator, rate.numerator);
    }
    return std::nullopt;
}

}  // namespace

int TimeScale::ToUnits(float time) const
{
    if (rate)
        if (auto const frame = FindFrame(time, *rate))
            return static_cast<int>(std::round(*frame * rate->denominator * scale / rate->numerator));
    return static_cast<int>(std::round(static_cast<double>(time) * scale));
}

TimeScale JudgeTimeScale(std::span<float const> times, unsigned int scale)
{
    if (scale == 0 || !Fits(Longest(times), scale))
        throw std::range_error("a time that doesn't fit a 32-bit time line of that scale");
    TimeScale result;
    result.scale = scale;
    Judge(times, result);
    return result;
}

TimeScale ChooseTimeScale(std::span<float const> times)
{
    double const longest = Longest(times);
    TimeScale result;
    result.rate = FindRate(times);
    for (unsigned int const scale : WellKnown) {
        result.scale = scale;
        auto const isExact = [&](float time) { return IsExact(time, result); };
        if (!Fits(longest, scale) || !std::ranges::all_of(times, isExact)) continue;
        Judge(times, result);
        return result;
    }
    result.scale = FinestScale(longest);
    if (result.scale == 0) throw std::range_error("a time that is too long for a 32-bit time line");
    Judge(times, result);
    return result;
}

unsigned int ChooseScaleForFrames(Rational const& frameTime, Rational const& last)
{
    double const longest = std::abs(last.ToDouble());
    if (std::int64_t const frames = frameTime.Denominator(); frames <= MaxKeyUnits) {
        for (unsigned int const common : CommonFrames) {
            std::int64_t const step = std::lcm(std::int64_t{common}, frames);
            if (common > 1 && step <= MaxKeyUnits && Fits(longest, static_cast<double>(step)))
                return static_cast<unsigned int>(step);
        }
        if (unsigned int const scale = FinestMultiple(static_cast<unsigned int>(frames), longest)) return scale;
    }
    return FinestScale(longest);
}

std::optional<Rational> ParseFrameTime(std::string_view text)
{
    constexpr int mostDigits = 12;  // with more, a million frames wouldn't fit a 64-bit fraction
    auto const number = ParseNumber(text);
    if (!number) {
        auto const fraction = Rational::Parse(text);
        return fraction && *fraction > Rational() ? fraction : std::nullopt;
    }
    int const digits = CountDigits(text);
    if (auto const spelled = FindSpelled(*number, digits)) return spelled;
    if (digits <= mostDigits)
        if (auto const exact = Rational::Parse(text)) return exact;
    std::array<char, 64> shorter{};
    auto const end = std::to_chars(shorter.data(), shorter.data() + shorter.size(), *number,
                                   std::chars_format::scientific, mostDigits - 1);
    auto const rounded = Rational::Parse(std::string_view(shorter.data(), end.ptr));
    return rounded && *rounded > Rational() ? rounded : std::nullopt;
}

}  // namespace kfshost
