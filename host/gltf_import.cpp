#include "host/gltf_accessor_private.h"
#include "host/import.h"
#include "host/import_error.h"
#include "host/names.h"
#include "host/rotations.h"
#include "host/storeerror.h"
#include "host/streambuilder.h"
#include "host/timescale.h"

#include <algorithm>
#include <map>
#include <stdexcept>
#include <utility>

namespace kfshost {

namespace {

// Channels may share accessors, so a small file can ask for any number of keys. It gets this many doubles in all key
// records, 8 MB, and so many more for each byte of its buffers. A component takes five doubles and one to four bytes, so
// that is sharing by six channels at least, and by 25 if they are floats.
constexpr std::size_t FreeNumbers = 1 << 20;
constexpr std::size_t NumbersPerByte = 32;
constexpr std::size_t NumbersPerComponent = 5;

struct PathKind {
    std::string_view path;
    StreamKind kind;
    int type;
    char const* typeName;
};

constexpr PathKind PathKinds[] = {
    {"translation", StreamKind::Translation, TINYGLTF_TYPE_VEC3, "VEC3"},
    {"rotation", StreamKind::Rotation, TINYGLTF_TYPE_VEC4, "VEC4"},
    {"scale", StreamKind::Scale, TINYGLTF_TYPE_VEC3, "VEC3"},
    {"weights", StreamKind::Weights, TINYGLTF_TYPE_SCALAR, "SCALAR"},
};

std::string At(std::string const& list, std::size_t index)
{
    return list + '[' + std::to_string(index) + ']';
}

SourceInterpolation InterpolationOf(tinygltf::AnimationSampler const& sampler, std::string const& place)
{
    if (sampler.interpolation == "STEP") return SourceInterpolation::Step;
    if (sampler.interpolation.empty() || sampler.interpolation == "LINEAR") return SourceInterpolation::Linear;
    if (sampler.interpolation == "CUBICSPLINE") return SourceInterpolation::CubicSpline;
    throw ImportError(place, "has the interpolation \"" + CleanName(sampler.interpolation) + '"');
}

KFS_Interp CodeOf(SourceInterpolation interpolation)
{
    switch (interpolation) {
    case SourceInterpolation::Step: return KFS_Interp_Hold;
    case SourceInterpolation::Linear: return KFS_Interp_Linear;
    case SourceInterpolation::CubicSpline: return KFS_Interp_Spline;
    }
    return KFS_Interp_None;
}

// One channel on its way from the file to a stream.
struct Channel {
    StreamItem item;
    PathKind const* path;
    int input;
    int output;
    std::size_t dimension;
    std::string samplerPlace;
};

// A channel's values, dimension by dimension within a key.
struct Values {
    std::vector<double> numbers;
    std::size_t dimension;
};

class GltfImport {
public:
    GltfImport(std::string_view bytes, std::string const& fileName) : document_(LoadGltfDocument(bytes, fileName))
    {
        scene_.name = StemOf(fileName);
    }

    Scene Run(ImportOptions const& options)
    {
        arcTolerance_ = options.arcTolerance;
        CollectChannels();
        ReadTimes();
        MeasureChannels();
        ChooseScale(options);
        for (Channel& channel : channels_) {
            MakeStream(channel);
            scene_.streams.push_back(std::move(channel.item));
        }
        return std::move(scene_);
    }

private:
    void CollectChannels()
    {
        for (std::size_t i = 0; i < document_.model.animations.size(); ++i) {
            tinygltf::Animation const& animation = document_.model.animations[i];
            std::string const name =
                animation.name.empty() ? "animation" + std::to_string(i) : CleanName(animation.name);
            for (std::size_t j = 0; j < animation.channels.size(); ++j)
                CollectChannel(animation, name, At("animations", i), j);
        }
    }

    // A channel without a node, or with a path of some extension, moves nothing that is known here.
    void CollectChannel(tinygltf::Animation const& animation, std::string const& animationName,
                        std::string const& place, std::size_t index)
    {
        tinygltf::AnimationChannel const& source = animation.channels[index];
        auto const path = std::ranges::find(PathKinds, source.target_path, &PathKind::path);
        if (source.target_node < 0 || path == std::end(PathKinds)) return;
        Channel channel{};
        channel.item.place = place + '.' + At("channels", index);
        if (static_cast<std::size_t>(source.target_node) >= document_.model.nodes.size()) {
            throw ImportError(channel.item.place, "asks for node " + std::to_string(source.target_node) + " of " +
                                                      std::to_string(document_.model.nodes.size()));
        }
        if (source.sampler < 0 || static_cast<std::size_t>(source.sampler) >= animation.samplers.size()) {
            throw ImportError(channel.item.place, "asks for sampler " + std::to_string(source.sampler) + " of " +
                                                      std::to_string(animation.samplers.size()));
        }
        auto const& sampler = animation.samplers[static_cast<std::size_t>(source.sampler)];
        channel.samplerPlace = place + '.' + At("samplers", static_cast<std::size_t>(source.sampler));
        channel.input = sampler.input;
        channel.output = sampler.output;
        channel.path = &*path;
        channel.item.kind = path->kind;
        channel.item.interpolation = InterpolationOf(sampler, channel.samplerPlace);
        channel.item.animation = animationName;
        channel.item.node = NodeName(source.target_node);
        channel.item.path = paths_.Make(PathOf(channel.item));
        channels_.push_back(std::move(channel));
    }

    std::string NodeName(int index) const
    {
        std::string const& name = document_.model.nodes[static_cast<std::size_t>(index)].name;
        return name.empty() ? "node" + std::to_string(index) : CleanName(name);
    }

    // Many channels share one list of times.
    void ReadTimes()
    {
        for (Channel const& channel : channels_) {
            if (times_.contains(channel.input)) continue;
            AccessorReader const accessor(document_, channel.input, channel.samplerPlace);
            accessor.RequireType(TINYGLTF_TYPE_SCALAR, "SCALAR");
            accessor.RequireFloats();
            std::vector<double> const numbers = accessor.ReadNumbers();
            std::vector<float> times(numbers.size());
            std::ranges::transform(numbers, times.begin(), [](double time) { return static_cast<float>(time); });
            for (std::size_t i = 1; i < times.size(); ++i) {
                if (!(times[i - 1] < times[i])) {
                    throw ImportError(accessor.Place(),
                                      "time " + std::to_string(i) + " isn't later than the one before it");
                }
            }
            times_.emplace(channel.input, std::move(times));
        }
    }

    void ChooseScale(ImportOptions const& options)
    {
        std::vector<float> all;
        for (auto const& [index, times] : times_) all.insert(all.end(), times.begin(), times.end());
        try {
            TimeScale const scale =
                options.timeScale == 0 ? ChooseTimeScale(all) : JudgeTimeScale(all, options.timeScale);
            scale_ = scale;
            scene_.timeScale = scale.scale;
            scene_.exactTimes = scale.exact;
            scene_.worstTimeError = scale.worstError;
        } catch (std::range_error const& error) {
            throw ImportError("key times", error.what());
        }
    }

    // Holds what the channels ask for against what there is, before anything of it is made.
    void MeasureChannels()
    {
        std::size_t most = FreeNumbers;
        for (auto const& buffer : document_.buffers) most += buffer.size() * NumbersPerByte;
        std::size_t numbers = 0;
        for (Channel& channel : channels_) {
            std::size_t const keys = times_.at(channel.input).size();
            channel.dimension = DimensionOf(channel, keys);
            numbers += keys * channel.dimension * NumbersPerComponent;
            if (numbers > most)
                throw ImportError(channel.item.place, "the file's channels ask for more keys than are accepted");
        }
    }

    std::size_t DimensionOf(Channel const& channel, std::size_t keys) const
    {
        AccessorReader const accessor(document_, channel.output, channel.samplerPlace);
        accessor.RequireType(channel.path->type, channel.path->typeName);
        bool const isSpline = channel.item.interpolation == SourceInterpolation::CubicSpline;
        std::size_t const elementsPerKey = isSpline ? 3 : 1;
        bool const isWeights = channel.path->kind == StreamKind::Weights;
        std::size_t const targets = isWeights && keys > 0 ? accessor.Count() / keys / elementsPerKey : 1;
        if (targets == 0 || accessor.Count() != keys * elementsPerKey * targets) {
            throw ImportError(channel.samplerPlace, "has " + std::to_string(accessor.Count()) + " values for " +
                                                        std::to_string(keys) + " times");
        }
        if (targets > static_cast<std::size_t>(StreamBuilder::MaxDimension)) {
            throw ImportError(channel.samplerPlace, "has " + std::to_string(targets) + " weights a key, more than " +
                                                        std::to_string(StreamBuilder::MaxDimension));
        }
        return isWeights ? targets : channel.path->kind == StreamKind::Rotation ? 4 : 3;
    }

    void MakeStream(Channel& channel)
    {
        std::vector<int> const times = PlaceTimes(channel);
        Values values{AccessorReader(document_, channel.output, channel.samplerPlace).ReadNumbers(), channel.dimension};
        channel.item.components = UsualComponents(channel.item.kind, values.dimension);
        bool const isSpline = channel.item.interpolation == SourceInterpolation::CubicSpline;
        bool const isRotation = IsRotation(channel.item);
        // A spline is the curve of the numbers as they stand: with another sign it would be another curve.
        if (isRotation && !isSpline) AlignSigns(values.numbers);
        try {
            StreamBuilder builder(channel.item.kind, static_cast<int>(values.dimension), scene_.timeScale);
            if (isRotation && channel.item.interpolation == SourceInterpolation::Linear && arcTolerance_ > 0.0)
                AppendArcs(builder, times, values);
            else
                AppendKeys(builder, channel, times, values);
            channel.item.stream = builder.Take();
        } catch (StoreError const& error) {
            throw ImportError(channel.item.place, error.what());
        }
    }

    std::vector<int> PlaceTimes(Channel const& channel) const
    {
        std::vector<float> const& times = times_.at(channel.input);
        std::vector<int> placed(times.size());
        std::ranges::transform(times, placed.begin(), [this](float time) { return scale_.ToUnits(time); });
        for (std::size_t i = 1; i < placed.size(); ++i) {
            if (placed[i] <= placed[i - 1]) {
                throw ImportError(channel.item.place, "keys " + std::to_string(i - 1) + " and " + std::to_string(i) +
                                                          " are closer than 1/" + std::to_string(scene_.timeScale) +
                                                          " s");
            }
        }
        return placed;
    }

    static void AppendKeys(StreamBuilder& builder, Channel const& channel, std::vector<int> const& times,
                           Values const& values)
    {
        KFS_Interp const code = CodeOf(channel.item.interpolation);
        if (channel.item.interpolation != SourceInterpolation::CubicSpline)
            return builder.Append(times, values.numbers, code);
        // A Hermite segment is the Bezier segment with handles at its thirds, whose slopes are the tangents.
        std::vector<double> const in = ThirdOf(values, 0), middle = ThirdOf(values, 1), out = ThirdOf(values, 2);
        std::vector<double> const thirds(middle.size(), 1.0 / 3.0);
        builder.Append(times, middle, code, {in.data(), thirds.data(), out.data(), thirds.data()});
    }

    // The tangents in, the values or the tangents out of all keys of a spline.
    static std::vector<double> ThirdOf(Values const& values, std::size_t which)
    {
        std::size_t const each = values.dimension;
        std::vector<double> third;
        third.reserve(values.numbers.size() / 3);
        for (std::size_t at = which * each; at + each <= values.numbers.size(); at += 3 * each)
            third.insert(third.end(), &values.numbers[at], &values.numbers[at] + each);
        return third;
    }

    void AppendArcs(StreamBuilder& builder, std::vector<int> const& times, Values const& values) const
    {
        std::vector<RotationKey> keys(times.size());
        for (std::size_t i = 0; i < times.size(); ++i) {
            keys[i].time = times[i];
            std::ranges::copy_n(&values.numbers[i * 4], 4, keys[i].value);
        }
        for (RotationKey const& key : WithArcKeys(keys, arcTolerance_))
            builder.Append(key.time, key.value, KFS_Interp_Linear, KFS_Interp_Linear);
    }

    GltfDocument document_;
    Scene scene_;
    UniqueNames paths_;
    std::vector<Channel> channels_;
    std::map<int, std::vector<float>> times_;
    TimeScale scale_;
    double arcTolerance_ = 0.0;
};

}  // namespace

Scene ImportGltfFromMemory(std::string_view bytes, std::string const& fileName, ImportOptions const& options)
{
    return GltfImport(bytes, fileName).Run(options);
}

}  // namespace kfshost
