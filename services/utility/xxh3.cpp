#include "frame/services/identifiers.h"

// The size of a state is what the header leaves room for.
#define XXH_STATIC_LINKING_ONLY
#include <xxhash.h>

#include <new>

namespace hearth::utility {

namespace {

XXH3_state_t* StateIn(unsigned char* storage) noexcept
{
    return std::launder(reinterpret_cast<XXH3_state_t*>(storage));
}

}  // namespace

HashValueMixerState::HashValueMixerState() noexcept
{
    static_assert(sizeof state_ >= sizeof(XXH3_state_t) && alignof(HashValueMixerState) >= alignof(XXH3_state_t));
    XXH3_128bits_reset(new (state_) XXH3_state_t);
}

void UpdateHashState(HashValueMixerState& state, void const* data, std::size_t size) noexcept
{
    if (size > 0) XXH3_128bits_update(StateIn(state.state_), data, size);
}

void GetHashResult(HashValueMixerState const& state, Guid& guid) noexcept
{
    XXH128_canonical_t canonical;
    static_assert(sizeof canonical == sizeof(Guid));
    XXH128_canonicalFromHash(&canonical,
                             XXH3_128bits_digest(std::launder(reinterpret_cast<XXH3_state_t const*>(state.state_))));
    std::array<unsigned char, sizeof(Guid)> bytes;
    std::memcpy(bytes.data(), canonical.digest, bytes.size());
    guid = Guid(bytes);
}

}  // namespace hearth::utility
