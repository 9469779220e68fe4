#pragma once

#include "host/scene.h"

#include <string>
#include <string_view>

namespace kfshost {

struct ImportOptions {
    // Units a second of all streams; 0 lets the importer choose (docs/host.md).
    unsigned int timeScale = 0;
    // Linear rotations get keys on the arc where the straight way between two keys may be farther from it than so many
    // degrees; 0 adds none.
    double arcTolerance = 0.0;
};

// What a file is: by how it begins, else by its name's ending.
enum class FileKind { Project, Gltf, Bvh };

// A file that was read, once and from front to back, so that it may be a pipe.
struct FileInput {
    std::string name;
    std::string bytes;
    FileKind kind = FileKind::Project;
};

// Reads a file; "-" is the standard input. What is none of the kinds is refused by its first bytes. Throws ImportError.
FileInput ReadInput(std::string const& fileName);

// A file's name as messages show it: control characters escaped, and words for the standard input.
std::string ShownFileName(std::string const& fileName);

// Reads the animation of a file: glTF 2.0 (.gltf, .glb) or BVH motion capture (.bvh). A Session must exist. Throws
// ImportError for what the file or the options are to blame for, a project among them, and std::bad_alloc.
Scene ImportFile(std::string const& fileName, ImportOptions const& options = {});
Scene ImportFile(FileInput const& input, ImportOptions const& options = {});

Scene ImportGltf(std::string const& fileName, ImportOptions const& options = {});
Scene ImportBvh(std::string const& fileName, ImportOptions const& options = {});

// The same with a file's bytes. Its name names the scene, and the folder where a glTF file's own buffers are looked for.
Scene ImportGltfFromMemory(std::string_view bytes, std::string const& fileName, ImportOptions const& options = {});
Scene ImportBvhFromMemory(std::string_view bytes, std::string const& fileName, ImportOptions const& options = {});

}  // namespace kfshost
