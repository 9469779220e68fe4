#pragma once

#include "cli/selection.h"
#include "overrides/parambag.h"

#include <CLI/CLI.hpp>

#include <memory>
#include <string>
#include <vector>

// What a command is to read in place of what the streams of its file say.

struct OverrideWords {
    std::vector<std::string> values;  // "PATH=1,2,3"; the last one for a stream counts
    std::string from;                 // another file, whose streams count where no value is given

    bool Any() const { return !values.empty() || !from.empty(); }
};

void AddOverrideWords(CLI::App& command, OverrideWords& words);

// The overrides of a scene, which must live longer. They tell streams apart by their places in the scene's tree
// (LoadSceneInTree). Where dimensions are separated the components are overridden.
class Overrides {
public:
    // Throws UserError, and what loading another file throws. Tells how many streams that file overrides.
    Overrides(kfshost::Scene const& scene, Selection const& selection, OverrideWords const& words);

    // For reads and identities; null where nothing is overridden.
    KFS_ParamBag const* Bag() const { return bag_.IsEmpty() ? nullptr : &bag_; }
    // The same, empty where nothing is.
    KFS_ParamBag const& WholeBag() const { return bag_; }

private:
    void TakeFrom(kfshost::Scene const& scene, Selection const& selection, std::string const& fileName);
    void TakeValues(kfshost::Scene const& scene, Selection const& selection, std::string const& word);
    bool Follow(kfshost::StreamItem const& item, kfshost::StreamItem const& other, std::string const& fileName);
    void Put(KFS_Stream const& stream, KFS_Stream const& source, int component);

    KFS_ParamBag bag_;
    std::vector<std::unique_ptr<KFS_Stream>> sources_;  // without a place in any tree, so that no override is theirs
};
