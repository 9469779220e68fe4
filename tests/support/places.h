#pragma once

#include <filesystem>

// Where a test finds what isn't compiled into it. Only places.cpp is told, so that the same sources make the same objects in
// every clone, which compiler caches like.
namespace kfstest {

std::filesystem::path DataFolder();     // real animation files; may be absent
std::filesystem::path SamplesFolder();  // the samples that ship with the tree
std::filesystem::path SourceFolder();   // the tree itself
char const* Command();                  // the kfs program of this build; null where it isn't built

}  // namespace kfstest
