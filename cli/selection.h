#pragma once

#include "host/scene.h"

#include <optional>
#include <string>
#include <vector>

// What a command is asked to look at.
struct Selection {
    std::string file;
    std::string glob = "*";
    unsigned int timeScale = 0;
    bool asPaths = false;        // positions are to be held as spatial streams
    bool roving = false;         // and their inner keys are to float; only with asPaths
    bool noExpressions = false;  // what the keys say
    // What was read is to be saved again. What had to be changed for a load would be lost then, so such a project is
    // refused.
    bool forSaving = false;

    // The file as it is called when something is told of it.
    std::string ShownFile() const;
};

// The scene of a selection's file, with paths where the selection asks for them. Throws UserError and what loading
// throws.
kfshost::Scene LoadScene(Selection const& selection);
// The same with all of its streams in a tree, where leaders have followers and streams can be told apart.
kfshost::Scene LoadSceneInTree(Selection const& selection);

// Whether an item has this path, or one that the pattern matches.
bool MatchesPath(kfshost::StreamItem const& item, std::string const& pattern);

// The streams whose paths the pattern matches, in the scene's order. Throws UserError when there are none.
std::vector<kfshost::StreamItem const*> SelectStreams(kfshost::Scene const& scene, Selection const& selection);

struct TimeSpan {
    kfshost::Rational first;
    kfshost::Rational last;
};

// From the first to the last key of all these streams; nothing if no stream has a key.
std::optional<TimeSpan> SpanOf(std::vector<kfshost::StreamItem const*> const& items);

// A time as "5/24"; as a decimal where the fraction would say nothing to anybody.
std::string TimeText(kfshost::Rational const& time);
