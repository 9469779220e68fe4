#include "host/import.h"

#include "host/filebytes_private.h"
#include "host/import_error.h"
#include "host/projectfile.h"

#include <algorithm>
#include <cctype>
#include <filesystem>

namespace kfshost {

Scene ImportFile(std::string const& fileName, ImportOptions const& options)
{
    std::string ending = std::filesystem::path(fileName).extension().string();
    std::ranges::transform(ending, ending.begin(), [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
    if (ending == ".gltf" || ending == ".glb") return ImportGltf(fileName, options);
    if (ending == ".bvh") return ImportBvh(fileName, options);
    ReadFileBytes(fileName, "", 1);  // a file that isn't there has no other fault
    throw ImportError("", IsProjectFile(fileName) ? "this is a project already"
                                                  : "isn't a project, and its name doesn't end in .gltf, .glb or .bvh");
}

}  // namespace kfshost
