#include "host/import.h"

#include "host/filebytes_private.h"
#include "host/import_error.h"
#include "host/names.h"

#include <algorithm>
#include <cctype>
#include <filesystem>
#include <limits>
#include <optional>

namespace kfshost {

namespace {

constexpr std::string_view ByteOrderMark = "\xEF\xBB\xBF";

std::optional<FileKind> KindByHead(std::string_view head)
{
    if (head.starts_with("KFSF")) return FileKind::Project;
    if (head.starts_with("glTF")) return FileKind::Gltf;
    if (head.starts_with(ByteOrderMark)) head.remove_prefix(ByteOrderMark.size());
    head.remove_prefix(std::min(head.find_first_not_of(" \t\r\n\v\f"), head.size()));
    if (head.starts_with('{')) return FileKind::Gltf;
    if (head.starts_with("HIERARCHY")) return FileKind::Bvh;
    return std::nullopt;
}

std::optional<FileKind> KindByName(std::string const& fileName)
{
    std::string ending = std::filesystem::path(fileName).extension().string();
    std::ranges::transform(ending, ending.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    if (ending == ".gltf" || ending == ".glb") return FileKind::Gltf;
    if (ending == ".bvh") return FileKind::Bvh;
    return std::nullopt;
}

}  // namespace

FileInput ReadInput(std::string const& fileName)
{
    FileReader reader(fileName, "");
    auto kind = KindByHead(reader.Head());
    if (!kind) kind = KindByName(fileName);
    if (!kind) {
        throw ImportError("", "begins neither as a project nor as glTF or BVH, and its name doesn't end in .gltf, .glb "
                              "or .bvh");
    }
    bool const isText = *kind == FileKind::Bvh;  // the others' lengths are 32-bit numbers
    std::size_t const most =
        isText ? std::numeric_limits<std::size_t>::max() : std::numeric_limits<std::uint32_t>::max();
    return {fileName, reader.Take(most), *kind};
}

std::string ShownFileName(std::string const& fileName)
{
    if (fileName.empty()) return "\"\"";
    return fileName == "-" ? "standard input" : CleanName(fileName);
}

Scene ImportFile(std::string const& fileName, ImportOptions const& options)
{
    return ImportFile(ReadInput(fileName), options);
}

Scene ImportFile(FileInput const& input, ImportOptions const& options)
{
    switch (input.kind) {
    case FileKind::Gltf: return ImportGltfFromMemory(input.bytes, input.name, options);
    case FileKind::Bvh: return ImportBvhFromMemory(input.bytes, input.name, options);
    case FileKind::Project: break;
    }
    throw ImportError("", "this is a project already");
}

Scene ImportGltf(std::string const& fileName, ImportOptions const& options)
{
    return ImportGltfFromMemory(ReadFileBytes(fileName, "", std::numeric_limits<std::uint32_t>::max()), fileName,
                                options);
}

Scene ImportBvh(std::string const& fileName, ImportOptions const& options)
{
    return ImportBvhFromMemory(ReadFileBytes(fileName, "", std::numeric_limits<std::size_t>::max()), fileName, options);
}

}  // namespace kfshost
