#include "frame/services/identifiers.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstdint>
#include <cstdio>
#include <random>
#include <string>
#include <utility>
#include <vector>

using namespace hearth::utility;

namespace {

std::string Hex(Guid const& guid)
{
    std::string text;
    for (unsigned char const byte : guid.GuidToBytes()) {
        char digits[3];
        std::snprintf(digits, sizeof digits, "%02x", byte);
        text += digits;
    }
    return text;
}

template <class State>
Guid HashOf(std::string const& bytes)
{
    State state;
    UpdateHashState(state, bytes.data(), bytes.size());
    Guid guid;
    GetHashResult(state, guid);
    return guid;
}

// The same 64 bits written as a number and then byte by byte from the least significant.
std::string LittleEndianHex(std::uint64_t h1, std::uint64_t h2)
{
    std::array<unsigned char, 16> bytes;
    for (std::size_t i = 0; i < 8; ++i) {
        bytes[i] = static_cast<unsigned char>(h1 >> (8 * i));
        bytes[i + 8] = static_cast<unsigned char>(h2 >> (8 * i));
    }
    return Hex(Guid(bytes));
}

TEST(Murmur3, GivesThePublishedValues)
{
    EXPECT_EQ(LittleEndianHex(0, 0), Hex(HashOf<Murmur3MixerState>("")));
    EXPECT_EQ(LittleEndianHex(0xCBD8A7B341BD9B02u, 0x5B1E906A48AE1D19u), Hex(HashOf<Murmur3MixerState>("hello")));
    EXPECT_EQ(LittleEndianHex(0xE34BBC7BBC071B6Cu, 0x7A433CA9C49A9347u),
              Hex(HashOf<Murmur3MixerState>("The quick brown fox jumps over the lazy dog")));
    EXPECT_EQ(LittleEndianHex(0x658CA970FF85269Au, 0x43FEE3EAA68E5C3Eu),
              Hex(HashOf<Murmur3MixerState>("The quick brown fox jumps over the lazy cog")));
}

std::string RandomBytes(std::mt19937& random, std::size_t size)
{
    std::string bytes(size, 0);
    for (char& byte : bytes) byte = static_cast<char>(random());
    return bytes;
}

// All lengths of the open block; the value is that of the function in one piece, its bytes taken one by one.
TEST(Murmur3, IsTheSameAtEveryLength)
{
    std::mt19937 random(1);
    std::string all;
    for (std::size_t size = 0; size < 100; ++size) all += Hex(HashOf<Murmur3MixerState>(RandomBytes(random, size)));
    EXPECT_EQ("1019aae0b6911e2c7e284eff50eceb0e", Hex(HashOf<Murmur3MixerState>(all)));
}

// Values of the library's own one-shot function.
TEST(HashValue, IsXxh3WithTheBytesInCanonicalOrder)
{
    EXPECT_EQ("99aa06d3014798d86001c324468d497f", Hex(HashOf<HashValueMixerState>("")));
    EXPECT_EQ("a96faf705af16834e6c632b61e964e1f", Hex(HashOf<HashValueMixerState>("a")));
    EXPECT_EQ("6a1af0913a0586138d044edb10064f94", Hex(HashOf<HashValueMixerState>("KFS_ParamBag")));
    EXPECT_EQ("ddd650205ca3e7fa24a1cc2e3a8a7651",
              Hex(HashOf<HashValueMixerState>("The quick brown fox jumps over the lazy dog")));
    std::string bytes(1000, 0);
    for (int i = 0; i < 1000; ++i) bytes[static_cast<std::size_t>(i)] = static_cast<char>(i * 7 + i / 256);
    EXPECT_EQ("bae798f9321bda6cd1db6a0afea2cc82", Hex(HashOf<HashValueMixerState>(bytes)));
}

template <class State>
class HashStates : public testing::Test {};
using BothStates = testing::Types<Murmur3MixerState, HashValueMixerState>;
TYPED_TEST_SUITE(HashStates, BothStates);

// However the bytes are cut, however often the result is read on the way, and also by a copy that goes on on its own.
TYPED_TEST(HashStates, DoNotDependOnHowTheBytesCome)
{
    std::mt19937 random(2);
    for (int i = 0; i < 400; ++i) {
        std::string const bytes = RandomBytes(random, random() % 700);
        Guid const whole = HashOf<TypeParam>(bytes);
        MixHashGuidT<TypeParam> mix;
        for (std::size_t at = 0; at < bytes.size();) {
            std::size_t const piece = std::min<std::size_t>(random() % 40, bytes.size() - at);
            ASSERT_EQ(HashOf<TypeParam>(bytes.substr(0, at)), mix.GetGuid());
            MixHashGuidT<TypeParam> const copy = mix;
            UpdateHashState(mix, bytes.data() + at, piece);
            mix = piece % 2 ? MixHashGuidT<TypeParam>(mix) : copy;
            if (piece % 2 == 0) mix.Mix(bytes.data() + at, piece);
            at += piece;
        }
        mix.Mix(nullptr, 0);
        Guid guid;
        GetHashResult(mix, guid);
        ASSERT_EQ(whole, guid) << bytes.size() << " bytes";
    }
}

TYPED_TEST(HashStates, NumbersAreTheirBytes)
{
    MixHashGuidT<TypeParam> numbers;
    numbers.MixNumber(0x01020304);
    numbers.MixNumber(1.5);
    int const integer = 0x01020304;
    double const real = 1.5;
    std::string bytes(reinterpret_cast<char const*>(&integer), 4);
    bytes.append(reinterpret_cast<char const*>(&real), 8);
    EXPECT_EQ(HashOf<TypeParam>(bytes), numbers.GetGuid());
}

TEST(Guid, OrdersByUnsignedBytesFromTheFirst)
{
    std::vector<Guid> ascending(1);  // not set: all zero
    EXPECT_EQ("00000000000000000000000000000000", Hex(ascending[0]));
    for (auto const& [at, value] :
         std::vector<std::pair<std::size_t, int>>{{15, 0x01}, {15, 0xFF}, {8, 0x01}, {7, 0x80}, {0, 0x7F}, {0, 0x80}}) {
        std::array<unsigned char, 16> bytes{};
        bytes[at] = static_cast<unsigned char>(value);
        ascending.emplace_back(bytes);
    }
    for (std::size_t i = 0; i < ascending.size(); ++i)
        for (std::size_t k = 0; k < ascending.size(); ++k) {
            EXPECT_EQ(i < k, ascending[i] < ascending[k]) << i << ", " << k;
            EXPECT_EQ(i == k, ascending[i] == ascending[k]) << i << ", " << k;
        }
    unsigned char bytes[16];
    Guid::GuidToBytes(ascending[3], bytes);
    EXPECT_EQ(1, bytes[8]);
}

}  // namespace
