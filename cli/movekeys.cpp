#include "cli/movekeys.h"

#include "cli/errors.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/projectoutput.h"

#include <fmt/format.h>

using kfshost::MoveNotes;
using kfshost::Scene;
using kfshost::StreamItem;

namespace {

struct Options {
    Selection selection;
    std::string output;
    double tolerance = kfshost::AnyError;
};

std::string TextOf(MoveNotes const& notes, StreamItem const& item)
{
    std::vector<std::string> parts;
    if (notes.IsOff()) {
        parts.push_back(fmt::format("up to {:.3g} off between keys, at {} s in {}", notes.worstError,
                                    TimeText(notes.worstTime),
                                    item.components[static_cast<std::size_t>(notes.worstComponent)]));
    }
    if (notes.bentArcs > 0)
        parts.push_back(Plural(notes.bentArcs, "bent arc has", "bent arcs have") +
                        " no exact form in single dimensions");
    if (notes.floatKeys > 0)
        parts.push_back(Plural(notes.floatKeys, "float key stays", "float keys stay") +
                        " at its time and floats no more");
    if (notes.addedKeys > 0)
        parts.push_back(Plural(notes.addedKeys, "key time", "key times") + " that not all dimensions had");
    if (notes.heldKeys > 0)
        parts.push_back(Plural(notes.heldKeys, "key", "keys") + " added one unit beside the jump of a dimension");
    std::string text;
    for (std::string const& part : parts) text += (text.empty() ? "" : "; ") + part;
    return text;
}

// Of the streams that are chosen those that are to be moved; where dimensions go with their leader, without them.
std::vector<StreamItem const*> ChooseStreams(Scene const& scene, Options const& options, Move const& move)
{
    std::vector<StreamItem const*> chosen = SelectStreams(scene, options.selection);
    StreamItem const* leader = nullptr;
    std::erase_if(chosen, [&](StreamItem const* item) {
        if (!IsFollower(*item)) leader = item;
        return IsFollower(*item) && move.skipsDimensions && leader &&
               item->stream->GetParent() == leader->stream->GetParent();
    });
    return chosen;
}

int Run(Options const& options, Move const& move)
{
    RefuseToOverwrite(options.selection.file, options.output);
    Scene const scene = LoadSceneInTree(options.selection);
    auto const chosen = ChooseStreams(scene, options, move);
    std::vector<std::string> told;
    for (StreamItem const* item : chosen) {
        try {
            std::string const text = TextOf(move.run(*item->stream, options.tolerance), *item);
            if (!text.empty()) told.push_back(item->path + ": " + text);
        } catch (kfshost::DimensionsError const& error) {
            throw UserError(options.selection.ShownFile() + ": " + item->path, error.what());
        }
    }
    for (std::string const& text : told) TellAbout(options.selection.file, text);
    WriteProject(dynamic_cast<kfshost::SceneGroup const&>(*scene.tree), options.output,
                 Plural(chosen.size(), "stream", "streams") + ' ' + move.done);
    return ExitDone;
}

}  // namespace

Work PrepareMove(CLI::App& command, Move const& move)
{
    auto const options = std::make_shared<Options>();
    options->selection.forSaving = true;
    command.add_option("FILE", options->selection.file, "a project, or a .gltf, .glb or .bvh file")->required();
    command.add_option("--stream", options->selection.glob, move.what)->required()->type_name("GLOB");
    AddOutput(command, options->output, "the new project file", "PROJECT");
    command
        .add_option("--tolerance", options->tolerance,
                    "refuse where a value between keys would be off by more than this, in the stream's units")
        ->check(NumberCheck(0.0, kfshost::AnyError))
        ->type_name("E");
    AddTimeScale(command, options->selection.timeScale);
    command.footer("Values at keys stay what they are. What between them can't stay is told on the standard error, "
                   "with how far it\n"
                   "is off; --tolerance makes an error of it.");
    return [options, move] { return Run(*options, move); };
}
