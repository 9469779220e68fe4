#pragma once

#include "host/rational.h"
#include "keystore/stream.h"

#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace kfshost {

// What a stream moves.
enum class StreamKind { Translation, Rotation, Scale, Weights, Angles };

// How the file it came from goes from key to key.
enum class SourceInterpolation { Step, Linear, CubicSpline };

std::string_view NameOf(StreamKind kind);
std::string_view NameOf(SourceInterpolation interpolation);

// Names for the components of a value that has none of its own: x, y, z and w, or w0, w1 and so on.
std::vector<std::string> UsualComponents(StreamKind kind, std::size_t dimension);

// One animated property of a scene.
struct StreamItem {
    std::string path;  // "animation/node/translation"; no two items of a scene have the same
    std::string animation;
    std::string node;
    std::string place;  // where the file has it: "animations[0].channels[2]", "joint Hips"
    StreamKind kind = StreamKind::Translation;
    SourceInterpolation interpolation = SourceInterpolation::Linear;
    std::vector<std::string> components;  // a name for each component of the value
    std::unique_ptr<KFS_Stream> stream;   // doubles; keys, though there may be none
};

// What an importer makes of a file: a flat list of streams in the file's order. It must be gone before the Session is.
struct Scene {
    std::string name;             // the file's name without folder and ending
    unsigned int timeScale = 0;   // of all streams
    bool exactTimes = true;       // whether each key time is the number that the file gives
    double worstTimeError = 0.0;  // the greatest distance of a key from the file's number, in seconds
    std::vector<StreamItem> streams;
};

// The path that an item has where no other has the same: its animation, node and kind.
std::string PathOf(StreamItem const& item);

// The number of keys of a stream.
int KeyCount(KFS_Stream const& stream);
// The time of a key. Throws StoreError.
Rational KeyTime(KFS_Stream const& stream, int index);

// The value of a stream at a time in seconds, into `dimension` doubles. Times beyond what the stream's 32-bit time line
// holds are held at its ends, where a stream's value is constant anyway. Throws StoreError, with KFS_Err_NoKeys for a
// stream without keys. Threads: as KFS_GetValueFPlus.
void ReadAt(KFS_Stream const& stream, Rational const& seconds, double* values);

}  // namespace kfshost
