#pragma once

#include "host/channelstream.h"

#include <memory>
#include <span>
#include <string>

namespace kfshost {

// The four numbers of a key's handles, for each component: speeds in value units a second, influences as fractions of
// the segment on that side. Of several keys one key's numbers behind the other's.
struct KeyHandles {
    double const* inSpeed = nullptr;
    double const* inInfluence = nullptr;
    double const* outSpeed = nullptr;
    double const* outInfluence = nullptr;
};

// Makes one stream of doubles, key after key. All of it throws StoreError.
class StreamBuilder {
public:
    // `dimension` is 1 to MaxDimension; 2 or 3 for a path.
    StreamBuilder(int dimension, unsigned int timeScale, std::string const& name, StreamForm form = StreamForm::Curves);
    // A leaf of a scene, as its kind describes it.
    StreamBuilder(StreamKind kind, int dimension, unsigned int timeScale, StreamForm form = StreamForm::Curves);

    // A key's record, five doubles a component behind a head, has to fit the 15 bits of a list item's size.
    static constexpr int MaxDimension = 818;

    // Keys come in the order of their times, `value` with `dimension` doubles. The codes are those of KFS_Interp for
    // the segments on both sides.
    void Append(int time, double const* value, KFS_Interp inInterp, KFS_Interp outInterp);
    // Many keys, all of them or none, with the same code on every side. The handles are those of all of them.
    void Append(std::span<int const> times, std::span<double const> values, KFS_Interp code,
                KeyHandles const& handles = {});
    // The handles of a key that stands already; they matter on sides that are KFS_Interp_Spline. On a path they are
    // single numbers, and a speed is distance along the path a second.
    void SetHandles(int index, KeyHandles const& handles);
    // Of a path: the tangents of a key that stands already, `dimension` doubles each, as offsets from its value. A key
    // that isn't given any keeps those that follow from its neighbours.
    void SetPathTangents(int index, double const* in, double const* out);
    // Of a path: how far a position may be off along the route, in value units.
    void SetPathAccuracy(double distance);

    std::unique_ptr<KFS_Stream> Take() { return std::move(stream_); }

private:
    std::unique_ptr<KFS_Stream> stream_;
};

}  // namespace kfshost
