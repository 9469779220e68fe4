#pragma once

#include "frame/export.h"
#include "frame/services/identifiers.h"
#include "frame/services/strings.h"

#include <boost/variant.hpp>

#include <array>
#include <vector>

// What an override gives in place of a stream's own value. The library carries, compares and hashes these values; what
// they mean is the host's affair. They own what they hold and know nothing of the tree.
//
// The hash contributions are the bytes as they lie in memory; an empty string adds none.
// Threads: plain values. One that sits in an override isn't changed any more, and readers copy it.

using KFS_OverrideHash = hearth::utility::MixHashGuidT<hearth::utility::HashValueMixerState>;

// A stretch of a styled text.
class KFS_API KFS_TextStreamTextRunInfo {
public:
    int length = 0;  // 16-bit units of the text
    u16str name;
    float size = 0;
    std::array<unsigned char, 4> attributes{};

    // A NaN in `size` makes two runs unequal, and neither of them the smaller one.
    bool operator==(KFS_TextStreamTextRunInfo const& other) const;
    bool operator!=(KFS_TextStreamTextRunInfo const& other) const;
    // By length, name (its units as unsigned numbers, a prefix first), size, attributes.
    bool operator<(KFS_TextStreamTextRunInfo const& other) const;
    void MixIn(KFS_OverrideHash& hash) const;
};

// A text with its styles.
class KFS_API KFS_TextStreamInfo {
public:
    u16str text;
    unsigned char attribute0 = 0;
    unsigned char attribute1 = 0;
    unsigned char attribute2 = 0;
    std::vector<KFS_TextStreamTextRunInfo> runs;

    // Whether the runs' lengths add up to the text's.
    bool Verify() const;

    bool operator==(KFS_TextStreamInfo const& other) const;
    bool operator!=(KFS_TextStreamInfo const& other) const;
    // By text, the three attributes, the runs (a prefix first).
    bool operator<(KFS_TextStreamInfo const& other) const;
    void MixIn(KFS_OverrideHash& hash) const;
};

// A reference to another source of the value.
class KFS_API KFS_AlternateSourceInfo {
public:
    int sourceId = 0;
    hearth::utility::Guid sourceGuid;

    KFS_AlternateSourceInfo() = default;
    KFS_AlternateSourceInfo(int const& id, hearth::utility::Guid const& guid);

    bool operator==(KFS_AlternateSourceInfo const& other) const;
    bool operator!=(KFS_AlternateSourceInfo const& other) const;
    bool operator<(KFS_AlternateSourceInfo const& other) const;
    // An id of 0 and a GUID that isn't set add nothing.
    void MixIn(KFS_OverrideHash& hash) const;
};

// The alternatives' order is part of the interface: values of different kinds are ordered by it. The vector holds the
// components of a plain value.
using KFS_OverrideValue = boost::variant<u16str, KFS_TextStreamInfo, std::vector<double>, KFS_AlternateSourceInfo>;
