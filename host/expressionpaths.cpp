// Which stream of a tree a path names.

#include "host/expressionpaths_private.h"

#include "host/channelstream.h"
#include "host/projectfile.h"

namespace kfshost {

StreamPaths::StreamPaths(SceneGroup const& tree) : stamp_(ChannelStream::LivesStamp())
{
    std::vector<ListedStream> const streams = ListStreams(tree);
    paths_.reserve(streams.size());  // the maps have views of them
    for (ListedStream const& listed : streams) {
        int const id = static_cast<int>(paths_.size());
        paths_.push_back(listed.path);
        byPath_.emplace(paths_.back(), Entry{listed.stream, id});
        byStream_.emplace(listed.stream, id);
    }
}

bool StreamPaths::IsCurrent() const
{
    return stamp_ == ChannelStream::LivesStamp();
}

StreamPaths::Entry StreamPaths::Find(std::string_view path) const
{
    auto const place = byPath_.find(path);
    return place == byPath_.end() ? Entry{} : place->second;
}

std::string const* StreamPaths::PathOf(KFS_Stream const* stream) const
{
    auto const place = byStream_.find(stream);
    return place == byStream_.end() ? nullptr : PathOf(place->second);
}

std::string const* StreamPaths::PathOf(int id) const
{
    return id >= 0 && static_cast<std::size_t>(id) < paths_.size() ? &paths_[static_cast<std::size_t>(id)] : nullptr;
}

SceneGroup const* SceneOf(KFS_Stream const& stream)
{
    KFS_StreamBase const* root = &stream;
    while (root->GetParent()) root = root->GetParent();
    return dynamic_cast<SceneGroup const*>(root);
}

std::shared_ptr<StreamPaths const> PathsOf(SceneGroup const& tree)
{
    return tree.KeepPaths([&](std::shared_ptr<StreamPaths const>& kept) {
        if (!kept || !kept->IsCurrent()) kept = std::make_shared<StreamPaths const>(tree);
    });
}

}  // namespace kfshost
