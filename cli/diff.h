#pragma once

#include "host/scene.h"

#include <string>

// What differs between two scenes, a line for each stream: "- path" or "+ path" of one that only the first or only the
// second has, "~ path: what first differs". Empty if nothing does. Times are compared as times, whatever their scale.
// Throws kfshost::StoreError.
std::string DifferencesOf(kfshost::Scene const& before, kfshost::Scene const& after);
