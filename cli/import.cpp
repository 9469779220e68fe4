#include "host/import.h"

#include "cli/command.h"
#include "cli/errors.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/projectoutput.h"

namespace {

struct Options {
    std::string file;
    std::string output;
    unsigned int timeScale = 0;
    double arcTolerance = 0.0;  // degrees; 0 adds no keys
};

int Run(Options const& options)
{
    RefuseToOverwrite(options.file, options.output);
    kfshost::Scene scene = ReadingFile(options.file, [&] {
        return kfshost::ImportFile(options.file, {options.timeScale, options.arcTolerance});
    });
    std::size_t keys = 0;
    for (kfshost::StreamItem const& item : scene.streams)
        keys += static_cast<std::size_t>(kfshost::KeyCount(*item.stream));
    std::string const what = Plural(scene.streams.size(), "stream", "streams") + ", " + Plural(keys, "key", "keys");
    WriteProject(*kfshost::MakeTree(std::move(scene)), options.output, what);
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    command.add_option("FILE", options->file, "a .gltf, .glb or .bvh file")->required();
    AddOutput(command, options->output, "the project file", "PROJECT");
    AddTimeScale(command, options->timeScale);
    command
        .add_option("--arc-tolerance", options->arcTolerance,
                    "add keys to linear rotations where the straight way may be so many degrees beside the arc")
        ->check(NumberCheck(1e-6, 180.0))
        ->type_name("DEGREES");
    return [options] { return Run(*options); };
}

}  // namespace

Command const ImportCommand{"Make and check projects", "import", "Save the animation of a file as a project", Prepare};
