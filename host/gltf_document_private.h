#pragma once

#include <string>
#include <string_view>

// Images play no part here, and the library that does the work is compiled already.
#define TINYGLTF_NO_STB_IMAGE
#define TINYGLTF_NO_STB_IMAGE_WRITE
#include <tiny_gltf.h>

namespace kfshost {

// The parts of a .gltf or .glb file that animation consists of, with the bytes of its buffers. Buffers in files of
// their own must lie in the file's folder or below. A channel without a target node has target_node -1. Throws
// ImportError.
tinygltf::Model LoadGltfDocument(std::string_view bytes, std::string const& fileName);

}  // namespace kfshost
