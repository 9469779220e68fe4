#include "host/rational.h"

#include <charconv>
#include <climits>
#include <limits>
#include <stdexcept>

namespace kfshost {

namespace {

__extension__ using Wide = __int128;

Wide Magnitude(Wide value)
{
    return value < 0 ? -value : value;
}

Wide CommonDivisor(Wide a, Wide b)
{
    while (b != 0) {
        Wide const rest = a % b;
        a = b;
        b = rest;
    }
    return a;
}

bool Fits(Wide value)
{
    return value >= std::numeric_limits<std::int64_t>::min() && value <= std::numeric_limits<std::int64_t>::max();
}

Rational Reduced(Wide numerator, Wide denominator)
{
    if (denominator == 0) throw std::invalid_argument("a rational number with a denominator of 0");
    if (denominator < 0) {
        numerator = -numerator;
        denominator = -denominator;
    }
    Wide const divisor = CommonDivisor(denominator, Magnitude(numerator));
    numerator /= divisor;
    denominator /= divisor;
    if (!Fits(numerator) || !Fits(denominator)) throw std::overflow_error("a rational number that doesn't fit 64 bits");
    return {static_cast<std::int64_t>(numerator), static_cast<std::int64_t>(denominator)};
}

// A text of digits alone, at least one.
std::optional<std::int64_t> ParseDigits(std::string_view text)
{
    std::int64_t value = 0;
    if (text.empty() || text.front() == '-') return std::nullopt;
    auto const [end, error] = std::from_chars(text.data(), text.data() + text.size(), value);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return value;
}

constexpr std::int64_t MostPlaces = 18;  // 10 to this power fits

Rational PowerOfTen(std::int64_t power)
{
    std::int64_t value = 1;
    for (std::int64_t i = 0; i < (power < 0 ? -power : power); ++i) value *= 10;
    return power < 0 ? Rational(1, value) : Rational(value, 1);
}

// Digits with or without a point.
std::optional<Rational> ParsePlainDecimal(std::string_view text)
{
    std::size_t const point = text.find('.');
    std::string_view const places = point == std::string_view::npos ? "" : text.substr(point + 1);
    auto const digits = ParseDigits(std::string(text.substr(0, point)).append(places));
    if (!digits || places.size() > MostPlaces) return std::nullopt;
    return Rational(*digits, 1) * PowerOfTen(-static_cast<std::int64_t>(places.size()));
}

std::optional<Rational> ParseDecimal(std::string_view text)
{
    std::size_t const mark = text.find_first_of("eE");
    auto const mantissa = ParsePlainDecimal(text.substr(0, mark));
    if (!mantissa || mark == std::string_view::npos) return mantissa;
    std::string_view exponent = text.substr(mark + 1);
    bool const negative = exponent.starts_with('-');
    exponent.remove_prefix(negative || exponent.starts_with('+') ? 1 : 0);
    auto const power = ParseDigits(exponent);
    if (!power || *power > MostPlaces) return std::nullopt;
    return *mantissa * PowerOfTen(negative ? -*power : *power);
}

}  // namespace

Rational::Rational(std::int64_t numerator, std::int64_t denominator) : numerator_(numerator), denominator_(denominator)
{
    if (denominator <= 0 || CommonDivisor(denominator, Magnitude(numerator)) != 1)
        *this = Reduced(numerator, denominator);
}

std::optional<Rational> Rational::Parse(std::string_view text)
try {
    bool const negative = !text.empty() && text.front() == '-';
    text.remove_prefix(negative ? 1 : 0);
    std::optional<Rational> value;
    std::size_t const slash = text.find('/');
    if (slash == std::string_view::npos) {
        value = ParseDecimal(text);
    } else {
        auto const numerator = ParseDigits(text.substr(0, slash));
        auto const denominator = ParseDigits(text.substr(slash + 1));
        if (numerator && denominator && *denominator != 0) value = Rational(*numerator, *denominator);
    }
    return value && negative ? std::optional(Rational() - *value) : value;
} catch (std::overflow_error const&) {
    return std::nullopt;
}

std::string Rational::ToString() const
{
    std::string text = std::to_string(numerator_);
    return denominator_ == 1 ? text : text + '/' + std::to_string(denominator_);
}

int Rational::ToUnits(unsigned int scale) const
{
    Wide const product = Wide(numerator_) * scale;
    Wide const half = denominator_ / 2;
    Wide const units = (Magnitude(product) + half) / denominator_;
    // INT_MIN is no time at all.
    return units > INT_MAX ? (product < 0 ? -INT_MAX : INT_MAX) : static_cast<int>(product < 0 ? -units : units);
}

Rational operator+(Rational const& a, Rational const& b)
{
    return Reduced(Wide(a.numerator_) * b.denominator_ + Wide(b.numerator_) * a.denominator_,
                   Wide(a.denominator_) * b.denominator_);
}

Rational operator-(Rational const& a, Rational const& b)
{
    return Reduced(Wide(a.numerator_) * b.denominator_ - Wide(b.numerator_) * a.denominator_,
                   Wide(a.denominator_) * b.denominator_);
}

Rational operator*(Rational const& a, Rational const& b)
{
    return Reduced(Wide(a.numerator_) * b.numerator_, Wide(a.denominator_) * b.denominator_);
}

Rational operator/(Rational const& a, Rational const& b)
{
    return Reduced(Wide(a.numerator_) * b.denominator_, Wide(a.denominator_) * b.numerator_);
}

std::strong_ordering operator<=>(Rational const& a, Rational const& b)
{
    Wide const left = Wide(a.numerator_) * b.denominator_;
    Wide const right = Wide(b.numerator_) * a.denominator_;
    return left < right   ? std::strong_ordering::less
           : right < left ? std::strong_ordering::greater
                          : std::strong_ordering::equal;
}

}  // namespace kfshost
