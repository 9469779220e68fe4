#pragma once

#include "tree/matchname.h"

#include <cstring>

using KFSp_IdentityHash = hearth::utility::MixHashGuidT<hearth::utility::Murmur3MixerState>;

// An identity begins with what kind of stream it is of, unless that is unknown.
inline void KFSp_MixInMatchName(KFSp_IdentityHash& hash, KFS_MatchName const& name)
{
    if (auto const* const text = reinterpret_cast<char const*>(name.GetName())) hash.Mix(text, std::strlen(text));
}
