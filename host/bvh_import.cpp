#include "host/bvh_parse_private.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/names.h"
#include "host/storeerror.h"
#include "host/streambuilder.h"
#include "host/timescale.h"

#include <algorithm>
#include <cmath>

namespace kfshost {

namespace {

bool Fits(Rational const& last, unsigned int scale)
{
    return std::abs(last.ToUnits(scale)) <= MaxKeyUnits;
}

// The channels of one kind that a joint has, by their columns in the frames.
struct ChannelSet {
    StreamKind kind;
    std::vector<std::string> names;
    std::vector<std::size_t> columns;
};

class BvhImport {
public:
    BvhImport(std::string_view bytes, std::string const& fileName) : motion_(ParseBvh(bytes))
    {
        scene_.name = StemOf(fileName);
    }

    Scene Run(ImportOptions const& options)
    {
        PlaceFrames(options);
        std::size_t column = 0;
        for (std::size_t i = 0; i < motion_.joints.size(); ++i) {
            BvhJoint const& joint = motion_.joints[i];
            std::string const place = "joints[" + std::to_string(i) + ']';
            AddStream(joint, place, Take(joint, StreamKind::Translation, "position", column));
            AddStream(joint, place, Take(joint, StreamKind::Angles, "rotation", column));
            column += joint.channels.size();
        }
        return std::move(scene_);
    }

private:
    void PlaceFrames(ImportOptions const& options)
    try {
        auto const lastFrame = static_cast<std::int64_t>(motion_.frames == 0 ? 0 : motion_.frames - 1);
        Rational const last = motion_.frameTime * Rational(lastFrame, 1);
        scene_.timeScale = options.timeScale == 0 ? ChooseScaleForFrames(motion_.frameTime, last) : options.timeScale;
        if (scene_.timeScale == 0 || !Fits(last, scene_.timeScale))
            throw ImportError("Frame Time", "the frames don't fit a 32-bit time line of that scale");
        for (std::int64_t frame = 0; frame <= lastFrame; ++frame) {
            Rational const time = motion_.frameTime * Rational(frame, 1);
            int const units = time.ToUnits(scene_.timeScale);
            if (frame > 0 && units <= times_.back())
                throw ImportError("Frame Time", "frames are closer than 1/" + std::to_string(scene_.timeScale) + " s");
            Rational const placed(units, scene_.timeScale);
            if (placed != time) {
                scene_.exactTimes = false;
                scene_.worstTimeError = std::max(scene_.worstTimeError, std::abs(placed.ToDouble() - time.ToDouble()));
            }
            times_.push_back(units);
        }
    } catch (std::overflow_error const&) {
        throw ImportError("Frame Time", "has too many digits for this number of frames");
    }

    static ChannelSet Take(BvhJoint const& joint, StreamKind kind, std::string_view ending, std::size_t column)
    {
        ChannelSet set{kind, {}, {}};
        for (std::size_t i = 0; i < joint.channels.size(); ++i) {
            if (joint.channels[i].ends_with(ending)) {
                set.names.push_back(joint.channels[i]);
                set.columns.push_back(column + i);
            }
        }
        return set;
    }

    void AddStream(BvhJoint const& joint, std::string const& place, ChannelSet const& channels)
    {
        if (channels.names.empty()) return;
        StreamItem item;
        item.animation = "motion";
        item.node = joint.name;
        item.place = place;
        item.kind = channels.kind;
        item.path = paths_.Make(PathOf(item));
        item.components = channels.names;
        try {
            item.stream = BuildStream(channels);
        } catch (StoreError const& error) {
            throw ImportError(place, error.what());
        }
        scene_.streams.push_back(std::move(item));
    }

    std::unique_ptr<KFS_Stream> BuildStream(ChannelSet const& channels) const
    {
        StreamBuilder builder(channels.kind, static_cast<int>(channels.columns.size()), scene_.timeScale);
        std::vector<double> values;
        values.reserve(motion_.frames * channels.columns.size());
        for (std::size_t frame = 0; frame < motion_.frames; ++frame) {
            double const* const row = motion_.numbers.data() + frame * motion_.channelCount;
            for (std::size_t const column : channels.columns) values.push_back(row[column]);
        }
        builder.Append(std::span(times_).first(motion_.frames), values, KFS_Interp_Linear);
        return builder.Take();
    }

    BvhMotion motion_;
    Scene scene_;
    UniqueNames paths_;
    std::vector<int> times_;
};

}  // namespace

Scene ImportBvhFromMemory(std::string_view bytes, std::string const& fileName, ImportOptions const& options)
{
    return BvhImport(bytes, fileName).Run(options);
}

}  // namespace kfshost
