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

// Deletes a stream, unless it has a place in a tree, which owns it then.
struct StreamDeleter {
    bool isOwner = true;

    StreamDeleter() = default;
    explicit StreamDeleter(bool owner) : isOwner(owner) {}
    StreamDeleter(std::default_delete<KFS_Stream>) {}
    void operator()(KFS_Stream* stream) const
    {
        if (isOwner) delete stream;
    }
};
// Takes a std::unique_ptr<KFS_Stream> as well.
using StreamPtr = std::unique_ptr<KFS_Stream, StreamDeleter>;

// One animated property of a scene, or one component of it: where an item's dimensions are separated
// (host/dimensions.h), an item for each component comes directly behind it, and its own stream answers their values.
struct StreamItem {
    static constexpr int WholeValue = -1;

    // "animation/node/translation", "animation/node/translation/x"; no two items of a scene have the same.
    std::string path;
    std::string animation;
    std::string node;
    std::string place;  // where the file has it: "animations[0].channels[2]", "joint Hips"
    StreamKind kind = StreamKind::Translation;
    SourceInterpolation interpolation = SourceInterpolation::Linear;
    std::vector<std::string> components;  // a name for each component of the value
    int component = WholeValue;           // of the item before, which this one moves
    StreamPtr stream;                     // doubles; keys, though there may be none
};

// What an importer makes of a file: a flat list of streams in the file's order. It must be gone before the Session is.
struct Scene {
    std::shared_ptr<KFS_StreamBase> tree;  // where those of its streams live that it doesn't own; may be null

    std::string name;             // the file's name without folder and ending
    unsigned int timeScale = 0;   // of all streams
    bool exactTimes = true;       // whether each key time is the number that the file gives
    double worstTimeError = 0.0;  // the greatest distance of a key from the file's number, in seconds
    std::vector<StreamItem> streams;
};

// The path that an item has where no other has the same: its animation, node and kind.
std::string PathOf(StreamItem const& item);

// Whether a stream is one component of another, and whether it is put together from such ones.
bool IsFollower(StreamItem const& item);
bool IsSeparated(KFS_Stream const& stream);

// The streams whose keys move a stream: its followers where its dimensions are separated, else itself.
std::vector<KFS_Stream const*> MoversOf(KFS_Stream const& stream);
// Whether there is a key that moves a stream, or a value at which it stands.
bool HasKeys(KFS_Stream const& stream);

// The number of a stream's own keys; -1 of a constant.
int KeyCount(KFS_Stream const& stream);
// The time of a key. Throws StoreError.
Rational KeyTime(KFS_Stream const& stream, int index);

// The value of a stream at a time in seconds, into `dimension` doubles. Times beyond what the stream's 32-bit time line
// holds are held at its ends, where a stream's value is constant anyway. Throws StoreError, with KFS_Err_NoKeys for a
// stream without keys. `bag`: overrides, may be null. Threads: as KFS_GetValueFPlus.
void ReadAt(KFS_Stream const& stream, Rational const& seconds, double* values, KFS_ParamBag const* bag = nullptr);

}  // namespace kfshost
