#pragma once

#include "cli/selection.h"

#include <string>

// The commands of kfs. All of them throw UserError, kfshost::ImportError and kfshost::StoreError, and write nothing
// then.

struct InfoOptions {
    Selection selection;
};

enum class Format { Table, Csv, Json };

struct EvalOptions {
    Selection selection;
    std::string from;  // empty: the first key
    std::string to;    // empty: the last key
    std::string fps = "24";
    Format format = Format::Table;
};

struct PlotOptions {
    Selection selection;
    std::string output;
    std::string fps = "24";
    bool inFrames = false;
    bool motion = false;  // routes in space in place of value graphs
};

void RunInfo(InfoOptions const& options);
void RunEval(EvalOptions const& options);
void RunPlot(PlotOptions const& options);
void RunMotionPlot(PlotOptions const& options);

// The scene of a selection's file, with paths where the selection asks for them.
kfshost::Scene LoadScene(Selection const& selection);

// "24" or "30000/1001", above 0. Throws UserError.
kfshost::Rational ParseFps(std::string const& text);
