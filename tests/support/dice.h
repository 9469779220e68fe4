// Random numbers that are the same everywhere: the standard library's distributions differ from one library to the next.
#pragma once

#include <cmath>
#include <cstdint>
#include <cstdlib>

class Dice {
public:
    explicit Dice(std::uint64_t seed) : state_(seed) {}
    std::uint64_t Bits()  // splitmix64
    {
        std::uint64_t z = (state_ += 0x9e3779b97f4a7c15u);
        z = (z ^ (z >> 30)) * 0xbf58476d1ce4e5b9u;
        z = (z ^ (z >> 27)) * 0x94d049bb133111ebu;
        return z ^ (z >> 31);
    }
    double Between(double low, double high)
    {
        return low + (high - low) * (static_cast<double>(Bits() >> 11) * 0x1p-53);
    }
    int Below(int count) { return static_cast<int>(Bits() % static_cast<std::uint64_t>(count)); }
    // Any size: sign, and 10 to a power within the given exponents.
    double Wild(int exponent)
    {
        double const value = std::pow(10.0, Between(-exponent, exponent));
        return Below(2) ? value : -value;
    }

private:
    std::uint64_t state_;
};

// How often a random test goes round: `usual`, or KFS_TEST_ROUNDS times as often.
inline int Rounds(int usual)
{
    char const* const factor = std::getenv("KFS_TEST_ROUNDS");
    return factor ? usual * std::atoi(factor) : usual;
}
