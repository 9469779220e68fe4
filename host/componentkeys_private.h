#pragma once

#include "keystore/stream.h"

#include <cstddef>
#include <span>
#include <vector>

// The keys of one component, as a stream of its own would have them: the form in which keys go from one stream to another.

namespace kfshost {

// One side of a key.
struct KeySide {
    char interp = 0;  // KFS_Interp
    double speed = 0.0;
    double influence = 0.0;
};

struct ComponentKey {
    int time = 0;  // units of the stream's scale
    double value = 0.0;
    KeySide in;
    KeySide out;
    unsigned short flags = 0;  // KFS_KeyFlag_Continuous and KFS_KeyFlag_Modifiable
};

using ComponentKeys = std::vector<ComponentKey>;

// All components of a stream that isn't a path; they have the same times. Throws StoreError.
std::vector<ComponentKeys> KeysOfCurves(KFS_Stream const& stream);

// Those of a path, whose route is only followed on straight arcs.
struct PathKeys {
    std::vector<ComponentKeys> components;
    std::size_t bentArcs = 0;
    std::size_t floatKeys = 0;
};
PathKeys KeysOfPath(KFS_Stream const& path);

// Gives keys with the same times, a component each, to a stream without keys. In a path the components have one handle
// for all. Codes are those of the first component. Throws StoreError.
void PutKeys(KFS_Stream& stream, std::span<ComponentKeys const> components);

}  // namespace kfshost
