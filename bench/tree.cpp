// Trees of many nodes of which one in a hundred is edited: what a node takes, and what it costs to build, save and load
// them.

#include "bench/panels.h"
#include "frame/services/chunkfile.h"
#include "frame/services/memory.h"

#include <benchmark/benchmark.h>

#include <fcntl.h>
#include <unistd.h>

#include <filesystem>
#include <memory>
#include <string>
#include <unordered_map>
#include <utility>
#include <vector>

namespace {

using namespace panels;

void Save(Root const& root, CKF_File& file)
{
    root.Write(&file);
    Check(file.Commit());
}

std::unique_ptr<Root> Load(CKF_File& file)
{
    auto root = std::make_unique<Root>();
    root->Read(&file, nullptr);
    return root;
}

std::vector<unsigned char> BytesOf(Root const& root)
{
    CKF_File file;
    Check(file.CreateInMemory(nullptr));
    Save(root, file);
    return {file.GetBytes().begin(), file.GetBytes().end()};
}

// ---- the same as plain records

struct PlainKey {
    int time;
    unsigned int rest;
    double numbers[5];
};
static_assert(sizeof(PlainKey) == KeySize);

// A slot is null or an edited leaf.
struct PlainLeaf {
    std::vector<PlainKey> keys;
};
struct PlainPanel {
    std::vector<std::unique_ptr<PlainLeaf>> slots{Slots};
};
using PlainTree = std::vector<std::unique_ptr<PlainPanel>>;

PlainTree BuildPlain(int nodes)
{
    PlainTree tree;
    for (int i = 0; i < PanelsOf(nodes); ++i) {
        tree.push_back(std::make_unique<PlainPanel>());
        auto& leaf = tree.back()->slots[static_cast<std::size_t>(SlotOf(i))];
        leaf = std::make_unique<PlainLeaf>();
        for (int key = 0; key < Keys; ++key) leaf->keys.push_back({key * 25, 0, {i * 0.5 + key * 0.375}});
    }
    return tree;
}

// ---- a file and its tree for each size

struct Fixture {
    explicit Fixture(int nodeCount) : nodes(nodeCount)
    {
        StartLibrary();
        Q_MemoryCount const before = Q_MemoryLive(nullptr);
        root = Build(nodes);
        memory = Q_MemoryLive(nullptr).bytes - before.bytes;
        bytes = BytesOf(*root);
        std::string pattern = (std::filesystem::temp_directory_path() / "kfs_bench_XXXXXX").string();
        if (!mkdtemp(pattern.data())) Stop("no folder for the benchmark");
        folder = pattern;
        WritePlainly(Path("plain"));
    }
    ~Fixture()
    {
        std::error_code ignored;
        std::filesystem::remove_all(folder, ignored);
    }
    Fixture(Fixture const&) = delete;
    Fixture& operator=(Fixture const&) = delete;

    std::string Path(char const* name) const { return folder + '/' + name; }

    // What a save promises, for bytes that are there: a temporary file, on the disk, in the target's place.
    void WritePlainly(std::string const& target) const
    {
        std::string const temporary = target + ".tmp";
        int const file = open(temporary.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0666);
        bool const written = write(file, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size());
        if (!written || fsync(file) != 0 || close(file) != 0 || rename(temporary.c_str(), target.c_str()) != 0)
            Stop("can't write " + target);
        int const place = open(folder.c_str(), O_RDONLY | O_DIRECTORY);
        fsync(place);
        close(place);
    }
    std::vector<unsigned char> ReadPlainly() const
    {
        std::vector<unsigned char> read_(bytes.size());
        int const file = open(Path("plain").c_str(), O_RDONLY);
        if (read(file, read_.data(), read_.size()) != static_cast<ssize_t>(read_.size())) Stop("can't read");
        close(file);
        return read_;
    }

    int nodes;
    std::unique_ptr<Root> root;
    long long memory = 0;
    std::vector<unsigned char> bytes;
    std::string folder;
};

Fixture const& Get(benchmark::State const& state)
{
    static std::unordered_map<int, std::unique_ptr<Fixture>> made;
    std::unique_ptr<Fixture>& fixture = made[static_cast<int>(state.range(0))];
    if (!fixture) fixture = std::make_unique<Fixture>(static_cast<int>(state.range(0)));
    return *fixture;
}

void Sizes(benchmark::internal::Benchmark* benchmark)
{
    benchmark->Arg(10000)->Arg(30000)->Arg(100000)->Unit(benchmark::kMicrosecond);
}

// ---- build, and what a node takes

void BuildOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    for (auto _ : state) {
        std::unique_ptr<Root> root = Build(fixture.nodes);
        state.PauseTiming();
        root.reset();
        state.ResumeTiming();
    }
    state.counters["bytes_a_node"] = static_cast<double>(fixture.memory) / fixture.nodes;
}
// Of memory the yardstick is a pointer a node and the real streams with their keys.
void BuildYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    for (auto _ : state) {
        PlainTree tree = BuildPlain(fixture.nodes);
        benchmark::DoNotOptimize(tree);
        state.PauseTiming();
        tree.clear();
        state.ResumeTiming();
    }
    auto const panel = static_cast<double>(sizeof(Panel) + sizeof(KFS_Stream) + KeySize * (Keys + 1));
    state.counters["bytes_a_node"] = sizeof(void*) + panel * PanelsOf(fixture.nodes) / fixture.nodes;
}
BENCHMARK(BuildOurs)->Name("tree_build/ours")->Apply(Sizes);
BENCHMARK(BuildYardstick)->Name("tree_build/yardstick")->Apply(Sizes);

// ---- save

// Onto a disk: most of it is the disk's.
void SaveOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    std::string const target = fixture.Path("ours");
    for (auto _ : state) {
        CKF_File file;
        Check(file.Create(target.c_str(), nullptr));
        Save(*fixture.root, file);
    }
    state.counters["MB"] = static_cast<double>(fixture.bytes.size()) / 1e6;
}
void SaveYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    for (auto _ : state) fixture.WritePlainly(fixture.Path("plain"));
}
BENCHMARK(SaveOurs)->Name("tree_save/ours")->Apply(Sizes)->UseRealTime();
BENCHMARK(SaveYardstick)->Name("tree_save/yardstick")->Apply(Sizes)->UseRealTime();

// Without the disk: the walk through the tree, beside putting the same chunks into a buffer one by one.
void WriteOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    for (auto _ : state) {
        CKF_File file;
        Check(file.CreateInMemory(nullptr));
        Save(*fixture.root, file);
        benchmark::DoNotOptimize(file.GetBytes().data());
    }
}
void WriteYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    std::vector<std::pair<std::size_t, std::size_t>> pieces;
    CKF_ChunkWalk walk(fixture.bytes);
    for (CKF_RawChunk chunk; walk.Next(&chunk);) {
        auto const begin = static_cast<std::size_t>(chunk.offset);
        bool const isList = chunk.id == CKF_ListId || chunk.offset == 0;
        std::size_t const end = isList ? begin + 12 : begin + 8 + chunk.data.size() + (chunk.data.size() & 1);
        pieces.emplace_back(begin, end);
    }
    for (auto _ : state) {
        std::vector<unsigned char> buffer;
        for (auto const& [begin, end] : pieces) {
            auto const first = fixture.bytes.begin();
            buffer.insert(buffer.end(), first + static_cast<std::ptrdiff_t>(begin),
                          first + static_cast<std::ptrdiff_t>(end));
        }
        benchmark::DoNotOptimize(buffer.data());
    }
}
BENCHMARK(WriteOurs)->Name("tree_write/ours")->Apply(Sizes);
BENCHMARK(WriteYardstick)->Name("tree_write/yardstick")->Apply(Sizes);

// ---- load

void LoadOurs(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    std::string const source = fixture.Path("plain");
    for (auto _ : state) {
        CKF_File file;
        Check(file.Open(source.c_str()));
        std::unique_ptr<Root> root = Load(file);
        state.PauseTiming();
        root.reset();
        state.ResumeTiming();
    }
}
// The bytes alone.
void LoadYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    for (auto _ : state) benchmark::DoNotOptimize(fixture.ReadPlainly().data());
}
BENCHMARK(LoadOurs)->Name("tree_load/ours")->Apply(Sizes);
BENCHMARK(LoadYardstick)->Name("tree_load/yardstick")->Apply(Sizes);

// The bytes, and a plain tree made of them.
void LoadTreeYardstick(benchmark::State& state)
{
    Fixture const& fixture = Get(state);
    for (auto _ : state) {
        benchmark::DoNotOptimize(fixture.ReadPlainly().data());
        PlainTree tree = BuildPlain(fixture.nodes);
        benchmark::DoNotOptimize(tree);
        state.PauseTiming();
        tree.clear();
        state.ResumeTiming();
    }
}
BENCHMARK(LoadOurs)->Name("tree_load_into_records/ours")->Apply(Sizes);
BENCHMARK(LoadTreeYardstick)->Name("tree_load_into_records/yardstick")->Apply(Sizes);

}  // namespace
