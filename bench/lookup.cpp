// Finding a stream in a tree of 100,000 nodes, and a match name's hash for its text, beside hash maps with the same keys.

#include "bench/panels.h"

#include <benchmark/benchmark.h>

#include <cstring>
#include <memory>
#include <random>
#include <string>
#include <string_view>
#include <unordered_map>
#include <utility>
#include <vector>

namespace {

using namespace panels;

constexpr int Nodes = 100000;

// Never ended, as the library isn't.
Root const& Tree()
{
    static Root const* const root = [] {
        StartLibrary();
        return Build(Nodes).release();
    }();
    return *root;
}

constexpr std::size_t Asked = 4096;

struct PathHash {
    std::size_t operator()(std::pair<unsigned int, KFS_MatchName> const& key) const
    {
        return NameHash{}(key.second) ^ (key.first * std::size_t{0x9E3779B97F4A7C15});
    }
    struct NameHash {
        std::size_t operator()(KFS_MatchName const& name) const
        {
            std::size_t hash = 0;
            std::memcpy(&hash, &name.GetGuid(), sizeof hash);
            return hash;
        }
    };
};

std::vector<std::pair<unsigned int, int>> AskedPlaces()
{
    std::mt19937 random(11);
    std::vector<std::pair<unsigned int, int>> places(Asked);
    for (auto& [panel, slot] : places) {
        panel = static_cast<unsigned int>(random()) % static_cast<unsigned int>(PanelsOf(Nodes));
        slot = static_cast<int>(random() % Slots);
    }
    return places;
}

void PathOurs(benchmark::State& state)
{
    Root const& root = Tree();
    std::vector<KFS_StreamIDPath> paths;
    for (auto const& [panel, slot] : AskedPlaces())
        paths.emplace_back(KFS_StreamID(panel, PanelName()), KFS_StreamID(LeafName(slot)));
    std::size_t i = 0;
    for (auto _ : state) benchmark::DoNotOptimize(root.FindStream(paths[i++ % Asked]));
}
void PathYardstick(benchmark::State& state)
{
    Root const& root = Tree();
    std::unordered_map<std::pair<unsigned int, KFS_MatchName>, KFS_StreamBase const*, PathHash> map;
    for (unsigned int panel = 0; panel < static_cast<unsigned int>(PanelsOf(Nodes)); ++panel) {
        KFS_StreamGroup const* const group = root.GetStream(panel)->GetAsGroup();
        for (unsigned int slot = 0; slot < Slots; ++slot) {
            KFS_StreamBase const* const leaf = group->GetStream(slot);
            map.emplace(std::pair{panel, leaf->GetMatchName()}, leaf);
        }
    }
    std::vector<std::pair<unsigned int, KFS_MatchName>> keys;
    for (auto const& [panel, slot] : AskedPlaces()) keys.emplace_back(panel, LeafName(slot));
    std::size_t i = 0;
    for (auto _ : state) benchmark::DoNotOptimize(map.find(keys[i++ % Asked])->second);
}
BENCHMARK(PathOurs)->Name("tree_find_by_path/ours");
BENCHMARK(PathYardstick)->Name("tree_find_by_path/yardstick");

// In one group of 99.
void NameOurs(benchmark::State& state)
{
    Root const& root = Tree();
    KFS_NamedStreamGroup const* const panel = root.GetStream(3U)->GetAsNamedGroup();
    std::vector<KFS_MatchName> names;
    for (auto const& place : AskedPlaces()) names.push_back(LeafName(place.second));
    std::size_t i = 0;
    for (auto _ : state) benchmark::DoNotOptimize(panel->GetStream(names[i++ % Asked], true));
}
void NameYardstick(benchmark::State& state)
{
    Root const& root = Tree();
    KFS_NamedStreamGroup const* const panel = root.GetStream(3U)->GetAsNamedGroup();
    std::unordered_map<KFS_MatchName, KFS_StreamBase const*, PathHash::NameHash> map;
    for (unsigned int slot = 0; slot < Slots; ++slot)
        map.emplace(panel->GetStream(slot)->GetMatchName(), panel->GetStream(slot));
    std::vector<KFS_MatchName> names;
    for (auto const& place : AskedPlaces()) names.push_back(LeafName(place.second));
    std::size_t i = 0;
    for (auto _ : state) benchmark::DoNotOptimize(map.find(names[i++ % Asked])->second);
}
BENCHMARK(NameOurs)->Name("tree_find_by_match_name/ours");
BENCHMARK(NameYardstick)->Name("tree_find_by_match_name/yardstick");

// From the text of a name to its hash.
std::vector<std::string> AskedTexts()
{
    std::vector<std::string> texts;
    for (auto const& place : AskedPlaces()) texts.push_back("Bench Leaf " + std::to_string(place.second));
    return texts;
}
void TextOurs(benchmark::State& state)
{
    std::vector<std::string> const texts = AskedTexts();
    std::size_t i = 0;
    for (auto _ : state) {
        KFS_MatchName const name(texts[i++ % Asked].c_str(), true);
        benchmark::DoNotOptimize(name);
    }
}
void TextYardstick(benchmark::State& state)
{
    std::vector<std::string> const texts = AskedTexts();
    std::unordered_map<std::string_view, KFS_MatchName> map;
    for (std::string const& text : texts) map.try_emplace(text, text.c_str(), true);
    std::size_t i = 0;
    for (auto _ : state) benchmark::DoNotOptimize(map.find(std::string_view(texts[i++ % Asked].c_str()))->second);
}
BENCHMARK(TextOurs)->Name("tree_match_name_of_text/ours");
BENCHMARK(TextYardstick)->Name("tree_match_name_of_text/yardstick");

}  // namespace
