#pragma once

#include "host/kinds.h"

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

namespace kfshost {

// The streams of a tree by the paths that a scene lists them by. Unchanging, so that renders can share it.
class StreamPaths {
public:
    explicit StreamPaths(SceneGroup const& tree);

    struct Entry {
        KFS_Stream const* stream = nullptr;
        int id = -1;  // its place in the tree's order
    };

    // Whether no leaf has come or gone since this was made: then all streams in it live.
    bool IsCurrent() const;
    // An entry without a stream where there is none.
    Entry Find(std::string_view path) const;
    // Null for a stream that isn't in the tree.
    std::string const* PathOf(KFS_Stream const* stream) const;
    std::string const* PathOf(int id) const;

private:
    std::uint64_t stamp_;
    std::vector<std::string> paths_;
    std::unordered_map<std::string_view, Entry> byPath_;
    std::unordered_map<KFS_Stream const*, int> byStream_;
};

// The scene's tree that a stream stands in, or null.
SceneGroup const* SceneOf(KFS_Stream const& stream);

// The paths of a tree as it is now. Any thread, while nobody changes what the tree consists of.
std::shared_ptr<StreamPaths const> PathsOf(SceneGroup const& tree);

}  // namespace kfshost
