#pragma once

#include "host/kinds.h"
#include "host/scene.h"

#include <memory>
#include <span>
#include <stdexcept>
#include <string>
#include <vector>

class CKF_IoHook;

// Scenes as trees, and trees as project files (docs/host.md, docs/file-format.md).

namespace kfshost {

// Why a project can't be loaded or saved: one line that begins with the file's name.
class ProjectError : public std::runtime_error {
public:
    ProjectError(std::string const& fileName, std::string const& what) : std::runtime_error(fileName + ": " + what) {}
};

// The tree of a scene, whose streams move into it. Items of one animation or node become one group if they follow each
// other in the way that importers list them.
std::unique_ptr<SceneGroup> MakeTree(Scene scene);

// The reverse: the streams leave the tree, which is of no use afterwards. Items come in the tree's order, with the
// paths that they had.
Scene TakeScene(std::unique_ptr<SceneGroup> tree);

// Replaces the file by a complete new one or leaves it as it is. The hook is for tests, and may be null. Throws
// ProjectError, for what LoadProject wouldn't take too.
void SaveProject(SceneGroup const& tree, std::string const& fileName, CKF_IoHook* hook = nullptr);
// The bytes that SaveProject puts into the file; `name` is the file's in the text of an error.
std::vector<unsigned char> SaveProjectToMemory(SceneGroup const& tree, std::string const& name);

// All of a project, or ProjectError. Its streams are made of numbers, their keys have finite values and stand in the
// order of their times, and the scale is the scene's.
std::unique_ptr<SceneGroup> LoadProject(std::string const& fileName);
std::unique_ptr<SceneGroup> LoadProjectFromMemory(std::span<unsigned char const> bytes, std::string const& name);

// Whether a file begins as projects do, whatever its name says.
bool IsProjectFile(std::string const& fileName);

}  // namespace kfshost
