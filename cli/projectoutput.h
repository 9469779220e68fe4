#pragma once

#include "host/projectfile.h"

#include <string>

// Saves a tree and tells so in a line with `what` behind the file's name, or not if that is empty. "-": its bytes alone go
// to the standard output. Throws UserError and kfshost::ProjectError.
void WriteProject(kfshost::SceneGroup const& tree, std::string const& output, std::string const& what);
