#include "cli/command.h"
#include "cli/errors.h"
#include "cli/options.h"
#include "cli/projectoutput.h"

namespace {

struct Options {
    std::string file;
    std::string output;
};

// Through the tree and nothing else, so that what a file has comes out as this version writes it.
int Run(Options const& options)
{
    WriteProject(*ReadingFile(options.file, [&] { return kfshost::LoadProject(options.file); }), options.output,
                 "saved");
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    command.add_option("FILE", options->file, "a project file")->required();
    AddOutput(command, options->output, "the new project file", "PROJECT");
    return [options] { return Run(*options); };
}

}  // namespace

Command const SaveAsCommand{"Make and check projects", "save-as", "Load a project and save it as another file",
                            Prepare};
