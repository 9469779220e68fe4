#include "host/chunkdump.h"

#include "frame/services/chunkfile.h"
#include "host/filebytes_private.h"
#include "host/names.h"
#include "keystore/stream.h"

#include <fmt/format.h>

#include <algorithm>
#include <bit>
#include <cstdint>
#include <iterator>
#include <limits>
#include <span>
#include <string_view>

namespace kfshost {

namespace {

using Bytes = std::span<unsigned char const>;

// What a line shows of long data.
constexpr std::size_t MostNumbers = 8;
constexpr std::size_t MostRawBytes = 16;
constexpr std::size_t MostText = 60;

Bytes AsBytes(std::string_view text)
{
    return {reinterpret_cast<unsigned char const*>(text.data()), text.size()};
}

std::uint64_t Unsigned(Bytes data, std::size_t offset, std::size_t size)
{
    std::uint64_t number = 0;
    for (std::size_t i = 0; i < size; ++i) number = number << 8 | data[offset + i];
    return number;
}

std::int32_t Long(Bytes data, std::size_t offset)
{
    return static_cast<std::int32_t>(Unsigned(data, offset, 4));
}

double Double(Bytes data, std::size_t offset)
{
    return std::bit_cast<double>(Unsigned(data, offset, 8));
}

std::string Quoted(Bytes data)
{
    std::string_view const text(reinterpret_cast<char const*>(data.data()), data.size());
    bool const isLong = text.size() > MostText;
    return '"' + CleanName(text.substr(0, MostText)) + (isLong ? "\"..." : "\"");
}

std::string QuotedLines(Bytes data)
{
    std::string text(data.begin(), data.end());
    std::ranges::replace(text, '\n', ' ');
    return Quoted(AsBytes(text));
}

std::string Version(Bytes data)
{
    return fmt::format("version {}.{}, encoding {}", Long(data, 0), Long(data, 4), Long(data, 8));
}

std::string Flags(Bytes data)
{
    return fmt::format("flags 0x{:X}", Unsigned(data, 0, 4));
}

// Padded with NULs.
std::string MatchName(Bytes data)
{
    return Quoted(data.first(static_cast<std::size_t>(std::ranges::find(data, 0) - data.begin())));
}

std::string StreamRecord(Bytes data)
{
    std::uint64_t const flags = Unsigned(data, 4, 2);
    std::string text =
        fmt::format("dimension {}, 1/{} s", static_cast<std::int16_t>(Unsigned(data, 2, 2)), Unsigned(data, 12, 4));
    text += (flags & KFS_StreamFlag_NoKeys) != 0 ? ", constant" : ", keys";
    text += (flags & KFS_StreamFlag_Spatial) != 0 ? ", spatial" : "";
    text += Unsigned(data, 56, 2) != 0 ? fmt::format(", custom, {} bytes", Unsigned(data, 58, 2)) : "";
    return text + (data[120] != 0 ? ", expression" : "");
}

std::string Doubles(Bytes data)
{
    std::size_t const count = data.size() / 8;
    std::string text;
    for (std::size_t i = 0; i < std::min(count, MostNumbers); ++i)
        text += fmt::format("{}{}", i == 0 ? "" : " ", Double(data, i * 8));
    return text + (count > MostNumbers ? fmt::format(" ... {} numbers", count) : "");
}

// Items of the only kind that such files have: keys, which begin with their time.
std::string Keys(Bytes data)
{
    std::uint64_t const itemSize = Unsigned(data, 0, 4);
    std::uint64_t const count = Unsigned(data, 4, 4);
    std::string text = fmt::format("{} keys of {} bytes", count, itemSize);
    if (itemSize < 8 || count == 0 || (data.size() - 8) / itemSize < count) return text;
    auto const last = static_cast<std::size_t>(8 + (count - 1) * itemSize);
    return text + fmt::format(", times {} to {}", Long(data, 8), Long(data, last));
}

std::string SceneTimes(Bytes data)
{
    return fmt::format("1/{} s, {}, off by up to {} s", Unsigned(data, 0, 4), Long(data, 4) ? "exact" : "rounded",
                       Double(data, 8));
}

std::string Number(Bytes data)
{
    return fmt::format("{}", Long(data, 0));
}

// Of its 32 bits a reader keeps the low 16.
std::string Selector(Bytes data)
{
    return fmt::format("selector {}", static_cast<std::int16_t>(Unsigned(data, 2, 2)));
}

std::string Layer(Bytes data)
{
    return fmt::format("layer {}", Long(data, 0));
}

std::string SliderMin(Bytes data)
{
    return fmt::format("slider from {}", Double(data, 0));
}

std::string SliderMax(Bytes data)
{
    return fmt::format("slider to {}", Double(data, 0));
}

std::string PathIdentifier(Bytes data)
{
    return fmt::format("path {}", Unsigned(data, 0, 4));
}

std::string Index(Bytes data)
{
    return Long(data, 0) == -1 ? "no index" : fmt::format("index {}", Long(data, 0));
}

std::string OldType(Bytes data)
{
    return Long(data, 0) == -1 ? "whole path" : fmt::format("old kind {}", Long(data, 0));
}

std::string Steps(Bytes data)
{
    return fmt::format("{} steps", Long(data, 0));
}

struct Decoder {
    int id;
    std::size_t least;  // bytes that it takes; data that is shorter is shown raw
    std::string (*decode)(Bytes data);
};

constexpr Decoder Decoders[] = {
    {CKF_Id("vers"), 12, Version},       {CKF_Id("kfsb"), 4, Flags},          {CKF_Id("kfsn"), 0, Quoted},
    {CKF_Id("kfmn"), 0, MatchName},      {CKF_Id("kfb4"), 124, StreamRecord}, {CKF_Id("cdat"), 8, Doubles},
    {CKF_Id("seql"), 8, Keys},           {CKF_Id("Utf8"), 0, Quoted},         {CKF_Id("khti"), 16, SceneTimes},
    {CKF_Id("khin"), 4, Number},         {CKF_Id("khco"), 0, QuotedLines},    {CKF_Id("kfpi"), 4, Layer},
    {CKF_Id("kfps"), 4, Selector},       {CKF_Id("kfum"), 8, SliderMin},      {CKF_Id("kfuM"), 8, SliderMax},
    {CKF_Id("kfli"), 4, PathIdentifier}, {CKF_Id("kfix"), 4, Index},          {CKF_Id("kfot"), 4, OldType},
    {CKF_Id("kfpl"), 4, Steps},
};

std::string Raw(Bytes data)
{
    std::string text;
    for (unsigned char const byte : data.first(std::min(data.size(), MostRawBytes)))
        text += fmt::format("{}{:02x}", text.empty() ? "" : " ", byte);
    return text + (data.size() > MostRawBytes ? " ..." : "");
}

std::string Content(CKF_RawChunk const& chunk)
{
    auto const found = std::ranges::find(Decoders, chunk.id, &Decoder::id);
    return found != std::end(Decoders) && chunk.data.size() >= found->least ? found->decode(chunk.data)
                                                                            : Raw(chunk.data);
}

std::string Letters(int id)
{
    std::string letters;
    for (int shift = 24; shift >= 0; shift -= 8) {
        auto const letter = static_cast<char>(id >> shift);
        letters += letter >= ' ' && letter <= '~' ? letter : '?';
    }
    return letters;
}

std::string Line(CKF_RawChunk const& chunk)
{
    std::string line = fmt::format("{:8}  {:{}}{}", chunk.offset, "", chunk.depth * 2, Letters(chunk.id));
    if (chunk.listType != 0) line += ' ' + Letters(chunk.listType);
    line += fmt::format(" [{}]", chunk.claimedSize);
    if (chunk.listType == 0 && !chunk.data.empty()) line += ' ' + Content(chunk);
    return line + (chunk.problem ? fmt::format("  <-- {}\n", chunk.problem) : "\n");
}

}  // namespace

// What isn't a project at all is known by its first bytes, however long it is.
ChunkDump DumpChunks(std::string const& fileName)
{
    constexpr std::string_view magic = "KFSF";
    FileReader reader(fileName, "");
    std::string_view const head = reader.Head();
    if (head.empty()) return {"       0  <-- the file is empty\n", 1};
    if (!magic.starts_with(head.substr(0, magic.size())))
        return {"       0  " + Quoted(AsBytes(head.substr(0, magic.size()))) + "  <-- no project begins so\n", 1};
    std::string const bytes = reader.Take(std::numeric_limits<std::uint32_t>::max());
    CKF_ChunkWalk walk(AsBytes(bytes));
    ChunkDump dump;
    for (CKF_RawChunk chunk; walk.Next(&chunk);) {
        dump.text += Line(chunk);
        dump.problems += chunk.problem ? 1 : 0;
    }
    return dump;
}

}  // namespace kfshost
