#pragma once

#include <compare>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace kfshost {

// An exact number, in lowest terms with a positive denominator: seconds, frames, and frames a second are all of this
// kind. Results that don't fit 64 bits throw std::overflow_error.
class Rational {
public:
    Rational() = default;
    // Throws std::invalid_argument for a denominator of 0.
    Rational(std::int64_t numerator, std::int64_t denominator);

    // "12", "-0.25", "30000/1001", ".0083333", "8.3333e-3": exactly what the text says. Nothing for any other text, for
    // a denominator of 0, and for what doesn't fit.
    static std::optional<Rational> Parse(std::string_view text);

    std::int64_t Numerator() const { return numerator_; }
    std::int64_t Denominator() const { return denominator_; }
    double ToDouble() const { return static_cast<double>(numerator_) / static_cast<double>(denominator_); }
    // "5/24", or "5" for a whole number.
    std::string ToString() const;

    // The nearest whole number of 1/`scale`, halves away from zero, held inside the range of a 32-bit time.
    int ToUnits(unsigned int scale) const;

    friend Rational operator+(Rational const& a, Rational const& b);
    friend Rational operator-(Rational const& a, Rational const& b);
    friend Rational operator*(Rational const& a, Rational const& b);
    // Throws std::invalid_argument for a `b` of 0.
    friend Rational operator/(Rational const& a, Rational const& b);
    friend bool operator==(Rational const& a, Rational const& b) = default;
    friend std::strong_ordering operator<=>(Rational const& a, Rational const& b);

private:
    std::int64_t numerator_ = 0;
    std::int64_t denominator_ = 1;
};

}  // namespace kfshost
