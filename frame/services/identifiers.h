// 16-byte identifiers and the two hashes that make them.
//
// The same bytes give the same identifier on every machine and in every version: identifiers are compared across
// processes. A hash is of the bytes in order, however they were cut into pieces, and covers neither lengths nor types.
//
// Threads: values; one state serves one thread at a time.
#pragma once

#include "frame/services/byteorder.h"
#include "frame/services/export.h"

#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <functional>
#include <type_traits>

namespace hearth::utility {

// 16 bytes; all zero by default, which stands for "not set".
class Guid {
public:
    constexpr Guid() noexcept = default;
    explicit constexpr Guid(std::array<unsigned char, 16> const& bytes) noexcept : bytes_(bytes) {}

    // The 16 bytes in order.
    constexpr std::array<unsigned char, 16> const& GuidToBytes() const noexcept { return bytes_; }
    void GuidToBytes(unsigned char* bytes) const noexcept { std::memcpy(bytes, bytes_.data(), bytes_.size()); }
    static std::array<unsigned char, 16> const& GuidToBytes(Guid const& guid) noexcept { return guid.bytes_; }
    static void GuidToBytes(Guid const& guid, unsigned char* bytes) noexcept { guid.GuidToBytes(bytes); }

    // The first or the last eight bytes as a number with the first byte on top, so that numbers compare as bytes do.
    std::uint64_t Half(int index) const noexcept
    {
        std::uint32_t words[2];
        std::memcpy(words, bytes_.data() + 8 * index, sizeof words);
        return std::uint64_t{Q_LongSwap(words[0])} << 32 | Q_LongSwap(words[1]);
    }

    bool operator==(Guid const& other) const noexcept
    {
        return std::memcmp(bytes_.data(), other.bytes_.data(), bytes_.size()) == 0;
    }

private:
    std::array<unsigned char, 16> bytes_{};
};

static_assert(sizeof(Guid) == 16);

inline void GuidToBytes(Guid const& guid, unsigned char* bytes) noexcept
{
    guid.GuidToBytes(bytes);
}

// Byte by byte as unsigned numbers, from the first.
inline bool operator<(Guid const& a, Guid const& b) noexcept
{
    return a.Half(0) != b.Half(0) ? a.Half(0) < b.Half(0) : a.Half(1) < b.Half(1);
}

// MurmurHash3 x64 128 with seed 0. The identifier's bytes are h1 and then h2, each least significant byte first.
class Murmur3MixerState {
private:
    friend KFS_SERVICE_API void UpdateHashState(Murmur3MixerState& state, void const* data, std::size_t size) noexcept;
    friend KFS_SERVICE_API void GetHashResult(Murmur3MixerState const& state, Guid& guid) noexcept;

    std::uint64_t h1_ = 0;
    std::uint64_t h2_ = 0;
    std::uint64_t length_ = 0;  // bytes fed so far
    unsigned char tail_[16]{};  // the last length_ % 16 of them, not yet mixed
};

// XXH3 with 128 bits, seed 0. The identifier's bytes are the canonical form, most significant first.
class HashValueMixerState {
public:
    KFS_SERVICE_API HashValueMixerState() noexcept;

private:
    friend KFS_SERVICE_API void UpdateHashState(HashValueMixerState& state, void const* data,
                                                std::size_t size) noexcept;
    friend KFS_SERVICE_API void GetHashResult(HashValueMixerState const& state, Guid& guid) noexcept;

    alignas(64) unsigned char state_[576];
};

// Feed bytes. Null is fine with size 0.
KFS_SERVICE_API void UpdateHashState(Murmur3MixerState& state, void const* data, std::size_t size) noexcept;
KFS_SERVICE_API void UpdateHashState(HashValueMixerState& state, void const* data, std::size_t size) noexcept;
// The hash of what was fed so far. The state stays as it is and can be fed on.
KFS_SERVICE_API void GetHashResult(Murmur3MixerState const& state, Guid& guid) noexcept;
KFS_SERVICE_API void GetHashResult(HashValueMixerState const& state, Guid& guid) noexcept;

// A hash state with its two operations.
template <class State>
class MixHashGuidT {
public:
    void Mix(void const* data, std::size_t size) noexcept { UpdateHashState(state_, data, size); }
    // Mixes a number as it lies in memory.
    template <class Number>
    requires std::is_arithmetic_v<Number>
    void MixNumber(Number number) noexcept { UpdateHashState(state_, &number, sizeof number); }
    Guid GetGuid() const noexcept
    {
        Guid guid;
        GetHashResult(state_, guid);
        return guid;
    }

    friend void UpdateHashState(MixHashGuidT& mix, void const* data, std::size_t size) noexcept { mix.Mix(data, size); }
    friend void GetHashResult(MixHashGuidT const& mix, Guid& guid) noexcept { guid = mix.GetGuid(); }

private:
    State state_;
};

}  // namespace hearth::utility

template <>
struct std::hash<hearth::utility::Guid> {
    // Identifiers are hashes already: half of one will do.
    std::size_t operator()(hearth::utility::Guid const& guid) const noexcept
    {
        std::uint64_t half;
        std::memcpy(&half, guid.GuidToBytes().data(), sizeof half);
        return half;
    }
};
