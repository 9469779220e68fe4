#pragma once

#include "host/import.h"
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

// The reverse. The streams stay in the tree, which becomes the scene's. Items come in the tree's order, with the paths that
// they had.
Scene TakeScene(std::unique_ptr<SceneGroup> tree);

// The streams of a tree by the paths that they have in its scene, in the tree's order.
struct ListedStream {
    std::string path;
    KFS_Stream const* stream;
};
std::vector<ListedStream> ListStreams(SceneGroup const& tree);

// Replaces the file by a complete new one or leaves it as it is. The hook is for tests, and may be null. Throws
// ProjectError, for what LoadProject wouldn't take too.
void SaveProject(SceneGroup const& tree, std::string const& fileName, CKF_IoHook* hook = nullptr);
// The bytes that SaveProject puts into the file; `name` is the file's in the text of an error.
std::vector<unsigned char> SaveProjectToMemory(SceneGroup const& tree, std::string const& name);

// What the library reported while it loaded a project: a sentence for each time that the file isn't what its version
// says and was cut or changed to fit. A load without any took the file as it stands.
struct LoadNotes {
    std::vector<std::string> reports;
};

// All of a project, or ProjectError. Its streams are made of numbers, their keys have finite values and stand in the
// order of their times, and the scale is the scene's.
//
// The library reports what it has to cut or change for that, such as key records that are longer than the stream's. With
// `notes` these reports are put there, and go nowhere else; without, they go where reports go.
std::unique_ptr<SceneGroup> LoadProject(std::string const& fileName, LoadNotes* notes = nullptr);
std::unique_ptr<SceneGroup> LoadProject(FileInput const& input, LoadNotes* notes = nullptr);
std::unique_ptr<SceneGroup> LoadProjectFromMemory(std::span<unsigned char const> bytes, std::string const& name,
                                                  LoadNotes* notes = nullptr);

}  // namespace kfshost
