#pragma once

#include "host/scene.h"

namespace kfshost {

// Whether a stream says where something is, in two or three components: then it can be held as a path.
bool IsPosition(StreamItem const& item);

// How many keys MakePath takes: a curved arc has a table of its own, so paths need more memory than curves.
inline constexpr int MaxPathKeys = 1'000'000;

// The keys of a position as a spatial stream, which moves along a route with one speed graph: the same positions at the
// same times, and between them the same route. docs/host.md tells what becomes of the timing. `item` is as an importer
// made it, with up to MaxPathKeys keys. Throws StoreError, and ImportError for distances that don't fit a double.
std::unique_ptr<KFS_Stream> MakePath(StreamItem const& item);

// Makes float keys of all keys between the first and the last: the route stays, and its timing is that of the two.
// Throws StoreError.
void LetInnerKeysFloat(KFS_Stream& path);

// Throw StoreError.
bool IsFloatKey(KFS_Stream const& path, int index);
std::size_t FloatKeyCount(KFS_Stream const& path);

}  // namespace kfshost
