#include "host/gltf_document_private.h"

#include "host/filebytes_private.h"
#include "host/gltf_json_private.h"
#include "host/import_error.h"
#include "host/names.h"

#include <algorithm>
#include <charconv>
#include <cstdint>
#include <filesystem>
#include <limits>
#include <string_view>

namespace kfshost {

namespace {

using nlohmann::json;

constexpr std::string_view Magic = "glTF";
constexpr std::size_t HeaderSize = 12;
constexpr std::size_t ChunkHeaderSize = 8;
constexpr std::uint32_t JsonChunk = 0x4E4F534A;
constexpr std::uint32_t BinaryChunk = 0x004E4942;

// The parts of a file; of a .gltf the whole text is the JSON.
struct Container {
    std::string_view text;
    std::string_view binary;
    bool isBinary = false;
};

std::uint32_t ReadWord(std::string_view bytes, std::size_t offset)
{
    auto const byte = [&](std::size_t i) { return std::uint32_t{static_cast<unsigned char>(bytes[offset + i])}; };
    return byte(0) | byte(1) << 8 | byte(2) << 16 | byte(3) << 24;
}

// Takes the chunk that `rest` begins with off it.
std::string_view TakeChunk(std::string_view& rest, std::uint32_t type, std::string const& place)
{
    if (rest.size() < ChunkHeaderSize) throw ImportError(place, "the file ends in the chunk's header");
    std::uint32_t const length = ReadWord(rest, 0);
    if (ReadWord(rest, 4) != type) throw ImportError(place, "is of another type than it must be");
    rest.remove_prefix(ChunkHeaderSize);
    if (length > rest.size()) {
        throw ImportError(place, "the file has " + std::to_string(rest.size()) + " of the chunk's " +
                                     std::to_string(length) + " bytes");
    }
    std::string_view const chunk = rest.substr(0, length);
    rest.remove_prefix(length);
    return chunk;
}

Container OpenBinary(std::string_view bytes)
{
    if (bytes.size() < HeaderSize)
        throw ImportError("header", "the file ends after " + std::to_string(bytes.size()) + " bytes");
    if (std::uint32_t const version = ReadWord(bytes, 4); version != 2)
        throw ImportError("header", "is of version " + std::to_string(version) + "; version 2 is supported");
    std::uint32_t const length = ReadWord(bytes, 8);
    if (length < HeaderSize || length > bytes.size()) {
        throw ImportError("header",
                          "the file has " + std::to_string(bytes.size()) + " bytes and says " + std::to_string(length));
    }
    std::string_view rest = bytes.substr(HeaderSize, length - HeaderSize);
    Container container;
    container.isBinary = true;
    container.text = TakeChunk(rest, JsonChunk, "JSON chunk");
    if (!rest.empty()) container.binary = TakeChunk(rest, BinaryChunk, "BIN chunk");
    return container;
}

Container Open(std::string_view bytes, std::string const& fileName)
{
    if (bytes.starts_with(Magic)) return OpenBinary(bytes);
    if (std::filesystem::path(fileName).extension() == ".glb")
        throw ImportError("header", "this isn't a binary glTF file");
    return {bytes, {}, false};
}

std::string DecodePercent(std::string_view text)
{
    std::string decoded;
    for (std::size_t i = 0; i < text.size(); ++i) {
        unsigned int code = 0;
        char const* const digits = text.data() + i + 1;
        if (text[i] == '%' && text.size() - i > 2 && std::from_chars(digits, digits + 2, code, 16).ptr == digits + 2) {
            decoded += static_cast<char>(code);
            i += 2;
        } else {
            decoded += text[i];
        }
    }
    return decoded;
}

// A buffer's own file, which must not be looked for outside the folder of the file that names it.
std::string FindBufferFile(std::string const& uri, std::string const& fileName, std::string const& place)
{
    std::string const name = DecodePercent(uri);
    std::filesystem::path const relative(name);
    bool const leavesFolder = relative.is_absolute() || std::ranges::find(relative, "..") != relative.end();
    if (leavesFolder || name.find(':') != std::string::npos || name.find('\0') != std::string::npos)
        throw ImportError(place, '"' + CleanName(name) + "\" isn't a file in this file's folder");
    return (std::filesystem::path(fileName).parent_path() / relative).string();
}

// The number of bytes that a base64 text stands for.
std::size_t Base64Size(std::string_view text)
{
    while (text.ends_with('=')) text.remove_suffix(1);
    return text.size() / 4 * 3 + text.size() % 4 * 3 / 4;
}

std::string Lacking(std::size_t has, std::uint64_t wants)
{
    return "has " + std::to_string(has) + " bytes of its " + std::to_string(wants);
}

std::span<unsigned char const> AsBytes(std::string_view text)
{
    return {reinterpret_cast<unsigned char const*>(text.data()), text.size()};
}

std::span<unsigned char const> Decode(std::string const& uri, std::uint64_t length, std::string const& place,
                                      GltfDocument& document)
{
    constexpr std::string_view marker = ";base64,";
    std::size_t const start = uri.find(marker);
    if (start == std::string::npos) throw ImportError(place, "has embedded data that isn't base64");
    std::string const data = uri.substr(start + marker.size());
    if (Base64Size(data) < length) throw ImportError(place, Lacking(Base64Size(data), length));
    std::vector<unsigned char>& bytes = document.decoded.emplace_back();
    std::string type;
    bool const isDecoded =
        tinygltf::DecodeDataURI(&bytes, type, "data:application/octet-stream;base64," + data, 0, false);
    if (!isDecoded || bytes.size() < length) throw ImportError(place, Lacking(bytes.size(), length));
    return bytes;
}

// Where a buffer's bytes are, as many as it says. Nothing is left for the reader to look for on the disk.
std::span<unsigned char const> FindBuffer(json const& buffer, std::string const& place, std::string const& fileName,
                                          Container const& container, GltfDocument& document)
{
    auto const length = buffer["byteLength"].get<std::uint64_t>();
    if (length == 0) throw ImportError(place, "has no bytes");
    std::string const uri = buffer.value("uri", "");
    std::span<unsigned char const> bytes;
    if (uri.empty()) {
        if (!container.isBinary) throw ImportError(place, "has no uri");
        bytes = AsBytes(container.binary);
    } else if (uri.starts_with("data:")) {
        bytes = Decode(uri, length, place, document);
    } else {
        bytes =
            AsBytes(document.files.emplace_back(ReadFileBytes(FindBufferFile(uri, fileName, place), place, length)));
    }
    if (bytes.size() < length) throw ImportError(place, Lacking(bytes.size(), length));
    return bytes.first(length);
}

// The reader gets texts alone.
tinygltf::FsCallbacks NoFiles()
{
    tinygltf::FsCallbacks callbacks{};
    callbacks.FileExists = [](std::string const&, void*) { return false; };
    callbacks.ExpandFilePath = [](std::string const& name, void*) { return name; };
    callbacks.ReadWholeFile = [](std::vector<unsigned char>*, std::string*, std::string const&, void*) {
        return false;
    };
    callbacks.WriteWholeFile = [](std::string*, std::string const&, std::vector<unsigned char> const&, void*) {
        return false;
    };
    return callbacks;
}

// The first line of what the reader says, and not too much of it: it may quote a whole buffer.
std::string FirstLine(std::string const& text)
{
    std::string line = CleanName(text.substr(0, text.find('\n')));
    return line.size() > 160 ? CleanName(line.substr(0, 160)) + "..." : line;
}

tinygltf::Model Parse(json const& document)
{
    tinygltf::TinyGLTF reader;
    reader.SetFsCallbacks(NoFiles());
    tinygltf::Model model;
    std::string error;
    std::string warning;
    std::string const text = document.dump();
    bool const done =
        text.size() <= std::numeric_limits<unsigned int>::max() &&
        reader.LoadASCIIFromString(&model, &error, &warning, text.data(), static_cast<unsigned int>(text.size()), "");
    if (!done || !error.empty())
        throw ImportError("", error.empty() ? "isn't glTF that can be read" : FirstLine(error));
    return model;
}

}  // namespace

GltfDocument LoadGltfDocument(std::string_view bytes, std::string const& fileName)
{
    Container const container = Open(bytes, fileName);
    json text = ParseGltfJson(container.text);
    GltfDocument document;
    std::size_t index = 0;
    for (json const& buffer : text["buffers"]) {
        document.buffers.push_back(
            FindBuffer(buffer, "buffers[" + std::to_string(index++) + ']', fileName, container, document));
    }
    text.erase("buffers");
    // The reader drops channels without a node, and with them the count of those that follow.
    for (json& animation : text["animations"])
        for (json& channel : animation["channels"]) channel["target"].emplace("node", -1);
    document.model = Parse(text);
    return document;
}

}  // namespace kfshost
