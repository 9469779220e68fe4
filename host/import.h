#pragma once

#include "host/scene.h"

#include <string>
#include <string_view>

namespace kfshost {

struct ImportOptions {
    // Units a second of all streams; 0 lets the importer choose (docs/host.md).
    unsigned int timeScale = 0;
};

// Reads the animation of a file: glTF 2.0 (.gltf, .glb) or BVH motion capture (.bvh), told apart by the name's ending.
// A Session must exist. Throws ImportError for what the file or the options are to blame for, and std::bad_alloc.
Scene ImportFile(std::string const& fileName, ImportOptions const& options = {});

Scene ImportGltf(std::string const& fileName, ImportOptions const& options = {});
Scene ImportBvh(std::string const& fileName, ImportOptions const& options = {});

// The same with a file's bytes. Its name names the scene, and the folder where a glTF file's own buffers are looked for.
Scene ImportGltfFromMemory(std::string_view bytes, std::string const& fileName, ImportOptions const& options = {});
Scene ImportBvhFromMemory(std::string_view bytes, std::string const& fileName, ImportOptions const& options = {});

}  // namespace kfshost
