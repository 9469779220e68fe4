#pragma once

#include "host/scene.h"
#include "tree/factory.h"
#include "tree/indexedgroup.h"
#include "tree/namedgroup.h"

#include <array>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

// The kinds of streams that a scene consists of as a tree:
//
//   SceneGroup       animations, any number
//   AnimationGroup   nodes, any number
//   NodeGroup        one leaf for each StreamKind, and behind the translation its three followers, each moving one
//                    component while the translation's dimensions are separated; canonical while the animation doesn't
//                    move it
//
// Names of animations and nodes are display names: they need not differ.

namespace kfshost {

class StreamPaths;

inline constexpr StreamKind AllStreamKinds[] = {StreamKind::Translation, StreamKind::Rotation, StreamKind::Scale,
                                                StreamKind::Weights, StreamKind::Angles};

// What there is to be known of an animated property beside its stream.
struct ChannelFacts {
    SourceInterpolation interpolation = SourceInterpolation::Linear;
    std::vector<std::string> components;
};

class NodeGroup final : public KFS_NamedStreamGroup {
public:
    NodeGroup(KFS_StreamFactory* factory, bool canonical);
    NodeGroup(NodeGroup const& source, KFS_CloneStreamParams const& params);
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override;
    void FillInDisplayName() const override;
    // A leaf comes in the form that the file has: as many components, a path or not. Leaves of files from before kinds had
    // records have no range for editors, and take their kind's.
    void ReadAndStore(KFS_MatchName const& name, CKF_File* file, CKF_ChunkInfo const* chunk) override;

    // The leaf that an animation moves; null while it is canonical.
    KFS_Stream const* FindChannel(StreamKind kind) const;
    // The leaf that moves one component where dimensions are separated; null while it is canonical, and for kinds that
    // aren't leaders.
    KFS_Stream const* FindFollower(StreamKind kind, int dimension) const;
    // Puts a leaf into the slot of its kind, which must be free. The node has to be in its scene already, since a leaf
    // takes the scale of the tree that it comes into. A stream of no kind becomes one of this kind.
    void PutChannel(StreamKind kind, std::unique_ptr<KFS_Stream> stream);
    // Puts a follower that was taken out of another node into its slot.
    void PutFollower(std::unique_ptr<KFS_Stream> follower);
    // Makes the slot canonical again; null if it was.
    std::unique_ptr<KFS_Stream> TakeChannel(StreamKind kind);

    ChannelFacts const& FactsOf(StreamKind kind) const { return facts_[static_cast<std::size_t>(kind)]; }
    void SetFacts(StreamKind kind, ChannelFacts facts) { facts_[static_cast<std::size_t>(kind)] = std::move(facts); }

private:
    std::array<ChannelFacts, std::size(AllStreamKinds)> facts_;
};

class AnimationGroup final : public KFS_IndexedStreamGroup {
public:
    AnimationGroup(KFS_StreamFactory* factory, bool canonical);
    AnimationGroup(AnimationGroup const& source, KFS_CloneStreamParams const& params);
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override;
    void FillInDisplayName() const override;

    NodeGroup& AppendNode(std::string const& name);
};

// The root. Its display name is the scene's.
class SceneGroup final : public KFS_IndexedStreamGroup {
public:
    explicit SceneGroup(KFS_StreamFactory* factory, bool canonical = false);
    SceneGroup(SceneGroup const& source, KFS_CloneStreamParams const& params);
    KFS_StreamBase* CloneStream(KFS_CloneStreamParams const& params) const override;
    void FillCanonicalLayout(KFS_CanonicalLayout* layout) override;
    void FillInDisplayName() const override;
    unsigned int GetPreferredTimeScale() const override { return times.scale; }
    // By the expression engine of the current render context; 1 without one.
    int EvaluateExpression(KFS_Stream const* stream, T_Time const* time, double* values, void** customValue,
                           KFS_ParamBag const* bag) override;

    AnimationGroup& AppendAnimation(std::string const& name);

    // As in a Scene.
    struct Times {
        unsigned int scale = 600;
        bool exact = true;
        double worstError = 0.0;
    };
    Times times;
    // Frames a second, where expressions count them (PrepareExpressions).
    std::optional<Rational> frameRate;

    // The paths of its streams, for whoever looks streams up by them. `renew` may replace what is kept.
    template <class Renew>
    std::shared_ptr<StreamPaths const> KeepPaths(Renew const& renew) const
    {
        std::lock_guard const guard(pathsLock_);
        renew(paths_);
        return paths_;
    }

private:
    mutable std::mutex pathsLock_;
    mutable std::shared_ptr<StreamPaths const> paths_;
};

// The text of a node's display name, fit to be shown.
std::string DisplayNameOf(KFS_StreamBase const& node);

// The kinds, registered with the default factory for as long as this object lives.
class SceneKinds {
public:
    SceneKinds();
    ~SceneKinds();
    SceneKinds(SceneKinds const&) = delete;
    SceneKinds& operator=(SceneKinds const&) = delete;

private:
    KFS_ScRegisterStreams batch_;
};

}  // namespace kfshost
