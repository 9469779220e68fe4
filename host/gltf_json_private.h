#pragma once

#include <nlohmann/json.hpp>

#include <string_view>

namespace kfshost {

// The JSON of a glTF 2.0 file, cut down to what its animation consists of, every member of it present where it must be
// and of the right type. Looks, meshes, extras and extensions are gone: nothing in them can make an import fail. Throws
// ImportError.
nlohmann::json ParseGltfJson(std::string_view text);

}  // namespace kfshost
