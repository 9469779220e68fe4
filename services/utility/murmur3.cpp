#include "frame/services/identifiers.h"

#include <algorithm>
#include <bit>

namespace hearth::utility {

namespace {

constexpr std::size_t BlockSize = 16;
constexpr std::uint64_t C1 = 0x87C37B91114253D5u;
constexpr std::uint64_t C2 = 0x4CF5AD432745937Fu;

std::uint64_t LoadLittleEndian(unsigned char const* bytes) noexcept
{
    std::uint64_t word;
    std::memcpy(&word, bytes, sizeof word);
    return std::endian::native == std::endian::little ? word : __builtin_bswap64(word);
}

void StoreLittleEndian(std::uint64_t word, unsigned char* bytes) noexcept
{
    if constexpr (std::endian::native == std::endian::big) word = __builtin_bswap64(word);
    std::memcpy(bytes, &word, sizeof word);
}

std::uint64_t ScrambleFirst(std::uint64_t k) noexcept
{
    return std::rotl(k * C1, 31) * C2;
}

std::uint64_t ScrambleSecond(std::uint64_t k) noexcept
{
    return std::rotl(k * C2, 33) * C1;
}

void MixBlock(std::uint64_t& h1, std::uint64_t& h2, unsigned char const* block) noexcept
{
    h1 ^= ScrambleFirst(LoadLittleEndian(block));
    h1 = (std::rotl(h1, 27) + h2) * 5 + 0x52DCE729u;
    h2 ^= ScrambleSecond(LoadLittleEndian(block + 8));
    h2 = (std::rotl(h2, 31) + h1) * 5 + 0x38495AB5u;
}

std::uint64_t FinalMix(std::uint64_t k) noexcept
{
    k = (k ^ (k >> 33)) * 0xFF51AFD7ED558CCDu;
    k = (k ^ (k >> 33)) * 0xC4CEB9FE1A85EC53u;
    return k ^ (k >> 33);
}

}  // namespace

void UpdateHashState(Murmur3MixerState& state, void const* data, std::size_t size) noexcept
{
    if (size == 0) return;
    unsigned char const* bytes = static_cast<unsigned char const*>(data);
    std::size_t const held = state.length_ % BlockSize;
    state.length_ += size;
    if (held > 0) {
        std::size_t const taken = std::min(BlockSize - held, size);
        std::memcpy(state.tail_ + held, bytes, taken);
        if (held + taken < BlockSize) return;
        MixBlock(state.h1_, state.h2_, state.tail_);
        bytes += taken;
        size -= taken;
    }
    for (; size >= BlockSize; bytes += BlockSize, size -= BlockSize) MixBlock(state.h1_, state.h2_, bytes);
    std::memcpy(state.tail_, bytes, size);
}

void GetHashResult(Murmur3MixerState const& state, Guid& guid) noexcept
{
    // The open block counts as padded with zeros, and a half of zeros mixes in nothing.
    std::array<unsigned char, BlockSize> last{};
    std::memcpy(last.data(), state.tail_, state.length_ % BlockSize);
    std::uint64_t h1 = state.h1_ ^ ScrambleFirst(LoadLittleEndian(last.data())) ^ state.length_;
    std::uint64_t h2 = state.h2_ ^ ScrambleSecond(LoadLittleEndian(last.data() + 8)) ^ state.length_;

    h1 += h2;
    h2 += h1;
    h1 = FinalMix(h1);
    h2 = FinalMix(h2);
    h1 += h2;
    h2 += h1;

    std::array<unsigned char, sizeof(Guid)> bytes;
    StoreLittleEndian(h1, bytes.data());
    StoreLittleEndian(h2, bytes.data() + 8);
    guid = Guid(bytes);
}

}  // namespace hearth::utility
