#pragma once

#include "frame/services/strings.h"

#include <algorithm>

// A hash of a stream's identifier, never 0. FNV-1a, over units instead of bytes.
inline unsigned int KFSp_CapsuleHash(u16str const& id)
{
    constexpr unsigned int Basis = 0x811c9dc5;
    constexpr unsigned int Prime = 0x01000193;
    unsigned int hash = Basis;
    for (unsigned short const unit : id) hash = (hash ^ unit) * Prime;
    return std::max(hash, 1U);
}
