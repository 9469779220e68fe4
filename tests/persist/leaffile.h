#pragma once

#include "tests/services/chunkbytes.h"
#include "tests/support/chunklines.h"
#include "tests/support/streams.h"

#include <bit>
#include <functional>
#include <string>

// Leaves in files, made by hand and taken apart.

inline std::string Short(unsigned value)
{
    return {static_cast<char>(value >> 8), static_cast<char>(value)};
}

inline std::string Double(double number)
{
    auto const bits = std::bit_cast<std::uint64_t>(number);
    return Long(static_cast<std::uint32_t>(bits >> 32)) + Long(static_cast<std::uint32_t>(bits));
}

inline std::string Doubles(std::vector<double> const& numbers)
{
    std::string bytes;
    for (double const number : numbers) bytes += Double(number);
    return bytes;
}

// The 124 bytes of a leaf's record, at first those of a constant of one double, at 600 units a second.
class LeafRecord {
public:
    LeafRecord() : bytes_(124, '\0')
    {
        Put(0, Short(KFS_StreamValidStamp)).Put(2, Short(1)).Put(4, Short(KFS_StreamFlag_NoKeys));
        Put(10, Short(KFS_InterpMask_All)).Put(12, Long(600)).Put(16, Double(0.0001));
        Put(24, Doubles({1, 1, 1, 1})).Put(58, Short(8)).Put(60, "\x09");
    }
    LeafRecord& Put(std::size_t offset, std::string const& bytes)
    {
        bytes_.replace(offset, bytes.size(), bytes);
        return *this;
    }
    LeafRecord& Dimension(int dimension) { return Put(2, Short(static_cast<unsigned>(dimension))); }
    LeafRecord& Flags(unsigned flags) { return Put(4, Short(flags)); }
    LeafRecord& HasList() { return Put(68, "\x01"); }
    LeafRecord& HasExpression(unsigned flags = 0) { return Put(116, Long(flags)).Put(120, "\x01"); }

    std::string const& Bytes() const { return bytes_; }
    operator std::string() const { return bytes_; }

private:
    std::string bytes_;
};

inline std::string Base(unsigned flags = KFS_BaseFlag_Active)
{
    return Atom("kfsb", Long(flags)) + Atom("kfsn", "");
}

// A leaf's list: what every node has, the record, and what is to follow.
inline std::string Leaf(std::string const& record, std::string const& rest)
{
    return List("kfbs", Base() + Atom("kfb4", record) + rest);
}

// A list of keys as it stands in a file.
inline std::string Keys(int itemSize, std::vector<std::string> const& items)
{
    std::string bytes = Long(static_cast<std::uint32_t>(itemSize)) + Long(static_cast<std::uint32_t>(items.size()));
    for (std::string const& item : items) bytes += item;
    return Atom("seql", bytes);
}

inline std::string KeyHead(int time, int in, int out, unsigned flags)
{
    return Long(static_cast<std::uint32_t>(time)) + static_cast<char>(in) + static_cast<char>(out) + Short(flags);
}

// A key of a plain stream of one dimension: a value, and tangents that say nothing.
inline std::string ScalarKey(int time, double value)
{
    return KeyHead(time, KFS_Interp_Linear, KFS_Interp_Linear, 0) + Doubles({value, 0, 0, 0, 0});
}

// Reads the first leaf of a file into a stream. The code that Read throws, or 0.
inline int ReadLeaf(KFS_Stream* stream, std::string const& file)
{
    CKF_File open;
    EXPECT_EQ(0, open.Open(Span(file))) << open.LastErrorText();
    return Thrown([&] { stream->Read(&open, nullptr); });
}

// What Write makes of a stream, in the version that `prepare` asks for.
inline MemoryFile Written(KFS_Stream const* stream, std::function<void(CKF_File*)> const& prepare = {})
{
    return MemoryFile([&](CKF_File* file) {
        if (prepare) prepare(file);
        EXPECT_EQ(0, Thrown([&] { stream->Write(file); }));
    });
}

inline int ReadLeaf(KFS_Stream* stream, MemoryFile const& file)
{
    return ReadLeaf(stream, std::string(file.Bytes().begin(), file.Bytes().end()));
}

// The data of the first chunk of that id in the leaf's list; "-" if there is none.
inline std::string DataOf(std::string const& id, MemoryFile const& file)
{
    CKF_ChunkWalk walk(file.Bytes());
    CKF_RawChunk chunk;
    while (walk.Next(&chunk))
        if (Long(static_cast<std::uint32_t>(chunk.id)) == id) return {chunk.data.begin(), chunk.data.end()};
    return "-";
}
