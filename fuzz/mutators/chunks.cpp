// How libFuzzer changes a project file: inside the data of one chunk, or by whole chunks, with all lengths put right
// again. Bytes changed at random are refused by the container and never get to what reads its content.

#include "frame/services/chunkfile.h"

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <random>
#include <string>
#include <vector>

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t maxSize);

namespace {

using Random = std::minstd_rand;

constexpr int FormId = CKF_Id("KFSF");
constexpr int ItemListId = CKF_Id("seql");

// One chunk; those inside it follow it and have greater depths.
struct Chunk {
    int id;
    int listType;
    int depth;
    std::string data;  // of an atom

    bool IsList() const { return id == CKF_ListId || id == FormId; }
};

using Chunks = std::vector<Chunk>;

Chunks Parse(std::uint8_t const* data, std::size_t size)
{
    Chunks chunks;
    CKF_ChunkWalk walk({data, size});
    CKF_RawChunk raw{};
    while (walk.Next(&raw)) {
        chunks.push_back({raw.id, raw.listType, raw.depth, {}});
        if (!chunks.back().IsList()) chunks.back().data.assign(raw.data.begin(), raw.data.end());
    }
    return chunks;
}

void AppendWord(std::string& bytes, std::uint32_t word)
{
    for (int shift = 24; shift >= 0; shift -= 8) bytes += static_cast<char>(word >> shift & 0xFF);
}

std::size_t EndOf(Chunks const& chunks, std::size_t at)
{
    std::size_t end = at + 1;
    while (end < chunks.size() && chunks[end].depth > chunks[at].depth) ++end;
    return end;
}

void Write(Chunks const& chunks, std::string& bytes)
{
    std::vector<std::size_t> open;  // where the lengths of the open lists stand
    auto const closeTo = [&](int depth) {
        for (; static_cast<int>(open.size()) > std::max(depth, 0); open.pop_back()) {
            std::string length;
            AppendWord(length, static_cast<std::uint32_t>(bytes.size() - open.back() - 4));
            bytes.replace(open.back(), 4, length);
        }
    };
    for (Chunk const& chunk : chunks) {
        closeTo(chunk.depth);
        AppendWord(bytes, static_cast<std::uint32_t>(chunk.id));
        if (chunk.IsList()) {
            open.push_back(bytes.size());
            AppendWord(bytes, 0);
            AppendWord(bytes, static_cast<std::uint32_t>(chunk.listType));
        } else {
            AppendWord(bytes, static_cast<std::uint32_t>(chunk.data.size()));
            bytes += chunk.data;
            bytes.append(chunk.data.size() % 2, '\0');
        }
    }
    closeTo(0);
}

// Makes the count of a list of items what its bytes allow.
void MendItems(std::string& data)
{
    if (data.size() < 8) return;
    std::uint32_t itemSize = 0;
    for (int i = 0; i < 4; ++i)
        itemSize = itemSize << 8 | static_cast<unsigned char>(data[static_cast<std::size_t>(i)]);
    if (itemSize == 0 || itemSize > data.size()) return;
    std::size_t const count = (data.size() - 8) / itemSize;
    data.resize(8 + count * itemSize);
    std::string word;
    AppendWord(word, static_cast<std::uint32_t>(count));
    data.replace(4, 4, word);
}

void MutateData(Chunk& chunk, Random& random)
{
    std::size_t const size = chunk.data.size();
    std::size_t const room = random() % 4 == 0 ? size + 64 : std::max<std::size_t>(size, 1);  // sizes mostly stay
    std::vector<std::uint8_t> data(chunk.data.begin(), chunk.data.end());
    data.resize(room);
    std::size_t changed = LLVMFuzzerMutate(data.data(), size, room);
    if (random() % 4 != 0) changed = size == 0 ? changed : size;
    chunk.data.assign(data.begin(), data.begin() + static_cast<std::ptrdiff_t>(changed));
    if (chunk.id == ItemListId && random() % 8 != 0) MendItems(chunk.data);
}

// Puts a copy of the chunk `source`, with what is in it, before a chunk of `chunks`.
void Insert(Chunks& chunks, std::size_t before, Chunks const& from, std::size_t source)
{
    Chunks copy(from.begin() + static_cast<std::ptrdiff_t>(source),
                from.begin() + static_cast<std::ptrdiff_t>(EndOf(from, source)));
    int const deeper = chunks[before].depth - copy.front().depth;
    for (Chunk& chunk : copy) chunk.depth += deeper;
    chunks.insert(chunks.begin() + static_cast<std::ptrdiff_t>(before), copy.begin(), copy.end());
}

// Any chunk but the outer one.
std::size_t Pick(Chunks const& chunks, Random& random)
{
    return 1 + random() % (chunks.size() - 1);
}

// Preferably one of the same id, such as a leaf's data in another leaf.
std::size_t PickAlike(Chunks const& chunks, Chunk const& model, Random& random)
{
    std::size_t at = Pick(chunks, random);
    for (int tries = 0; tries < 16 && (chunks[at].id != model.id || chunks[at].listType != model.listType); ++tries)
        at = Pick(chunks, random);
    return at;
}

void Mutate(Chunks& chunks, Chunks const& other, Random& random)
{
    std::size_t const at = Pick(chunks, random);
    std::size_t const source = PickAlike(other, chunks[at], random);
    auto const begin = chunks.begin() + static_cast<std::ptrdiff_t>(at);
    switch (random() % 12) {
    case 0: Insert(chunks, at, other, source); break;
    case 1: chunks.erase(begin, chunks.begin() + static_cast<std::ptrdiff_t>(EndOf(chunks, at))); break;
    case 2: {  // a chunk takes another one's place
        std::size_t const end = EndOf(chunks, at);
        Chunks const taken = other;
        chunks.erase(begin + 1, chunks.begin() + static_cast<std::ptrdiff_t>(end));
        Insert(chunks, at, taken, source);
        chunks.erase(chunks.begin() + static_cast<std::ptrdiff_t>(EndOf(chunks, at)));
        break;
    }
    case 3: chunks[at].id = chunks[at].IsList() ? chunks[at].id : other[source].id; break;
    default:
        // Lists have no data of their own: the first atom behind it.
        for (std::size_t i = at; i < chunks.size(); ++i) {
            if (!chunks[i].IsList()) {
                MutateData(chunks[i], random);
                break;
            }
        }
    }
}

// 0 where the result is too long.
std::size_t Finish(Chunks const& chunks, std::uint8_t* data, std::size_t maxSize)
{
    std::string bytes;
    Write(chunks, bytes);
    if (bytes.size() > maxSize) return 0;
    std::memcpy(data, bytes.data(), bytes.size());
    return bytes.size();
}

}  // namespace

extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size, std::size_t maxSize,
                                               unsigned int seed)
{
    Random random(seed);
    Chunks chunks = Parse(data, size);
    if (chunks.size() < 2 || random() % 32 == 0) return LLVMFuzzerMutate(data, size, maxSize);
    for (unsigned long edits = 1 + random() % 3; edits > 0 && chunks.size() > 1; --edits) {
        Chunks const other = chunks;
        Mutate(chunks, other, random);
    }
    std::size_t const made = Finish(chunks, data, maxSize);
    return made > 0 ? made : LLVMFuzzerMutate(data, size, maxSize);
}

extern "C" std::size_t LLVMFuzzerCustomCrossOver(std::uint8_t const* data1, std::size_t size1,
                                                 std::uint8_t const* data2, std::size_t size2, std::uint8_t* out,
                                                 std::size_t maxSize, unsigned int seed)
{
    Random random(seed);
    Chunks chunks = Parse(data1, size1);
    Chunks const other = Parse(data2, size2);
    if (chunks.size() < 2 || other.size() < 2) return 0;
    std::size_t const at = Pick(chunks, random);
    Insert(chunks, at, other, PickAlike(other, chunks[at], random));
    return Finish(chunks, out, maxSize);
}
