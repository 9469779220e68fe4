#pragma once

#include "host/projectfile.h"
#include "host/streambuilder.h"
#include "tests/host/gltf_files.h"

#include <string>
#include <vector>

// Small files of all kinds and shapes, made by this build: what the hostile tests damage, and where fuzzing begins.

struct Sample {
    std::string name;
    std::string bytes;
};

// Projects: each with another thing in it.
std::vector<Sample> ProjectSamples();
// Groups of the kinds of fuzz/treekinds.h, which must be registered.
std::vector<Sample> TreeSamples();
std::vector<Sample> GltfSamples();
std::vector<Sample> BvhSamples();
