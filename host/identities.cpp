#include "host/identities.h"

#include "host/scene.h"
#include "host/storeerror.h"

#include <climits>
#include <stdexcept>

namespace kfshost {

namespace {

using Hash = hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>;

hearth::utility::Guid IdentityOfMovers(KFS_Stream const& leader, Render const& render)
{
    Hash hash;
    hash.Mix(leader.GetRenderGuid(render, nullptr).GuidToBytes().data(), 16);
    for (KFS_Stream const* const follower : MoversOf(leader))
        hash.Mix(follower->GetRenderGuid(render, nullptr).GuidToBytes().data(), 16);
    return hash.GetGuid();
}

}  // namespace

Render::Render(KFS_ParamBag const& bag, unsigned int timeScale)
    : bag_(bag),
      start_{0, timeScale},
      duration_{0, timeScale},
      shutter_{0, timeScale}
{}

void Render::SetSpan(Rational const& from, Rational const& to)
{
    std::int64_t const start = from.ToUnits(start_.scale);
    std::int64_t const length = to.ToUnits(start_.scale) - start;
    if (length > INT_MAX) throw std::length_error("a span is longer than a stream's time line");
    start_.value = static_cast<int>(start);
    duration_.value = static_cast<int>(length);
}

hearth::utility::Guid IdentityOf(KFS_StreamBase const& stream, Render const& render)
try {
    KFS_Stream const* const leaf = stream.GetAsLeaf();
    return leaf && IsSeparated(*leaf) ? IdentityOfMovers(*leaf, render) : stream.GetRenderGuid(render, nullptr);
} catch (int code) {
    throw StoreError(code);
}

std::string TextOf(hearth::utility::Guid const& identity)
{
    constexpr char digits[] = "0123456789abcdef";
    std::string text;
    for (unsigned char const byte : identity.GuidToBytes()) {
        text += digits[byte >> 4];
        text += digits[byte & 15];
    }
    return text;
}

}  // namespace kfshost
