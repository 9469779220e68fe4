#pragma once

#include <deque>
#include <span>
#include <string>
#include <string_view>
#include <vector>

// Images play no part here, and the library that does the work is compiled already.
#define TINYGLTF_NO_STB_IMAGE
#define TINYGLTF_NO_STB_IMAGE_WRITE
#include <tiny_gltf.h>

namespace kfshost {

// The parts of a .gltf or .glb file that animation consists of. Buffers are looked at where their bytes lie, which for
// a .glb is the file that was read: it has to stay as long as this.
struct GltfDocument {
    tinygltf::Model model;  // without buffers
    std::vector<std::span<unsigned char const>> buffers;
    std::deque<std::vector<unsigned char>> decoded;  // what stood in the text
    std::deque<std::string> files;                   // what has a file of its own
};

// Buffers in files of their own must lie in the file's folder or below. A channel without a target node has target_node
// -1. Throws ImportError.
GltfDocument LoadGltfDocument(std::string_view bytes, std::string const& fileName);

}  // namespace kfshost
