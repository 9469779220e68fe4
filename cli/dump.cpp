#include "cli/command.h"
#include "cli/errors.h"
#include "cli/output.h"
#include "host/chunkdump.h"

namespace {

// Shows what it can, and then tells by the exit code whether all of it was sound.
int Run(std::string const& file)
{
    kfshost::ChunkDump const dump = ReadingFile(file, [&] { return kfshost::DumpChunks(file); });
    WriteToStandardOutput(dump.text);
    return dump.problems > 0 ? ExitFound : ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const file = std::make_shared<std::string>();
    command.add_option("FILE", *file, "a project file")->required();
    command.footer("Each line has the offset of a chunk, its id, its length in brackets, and what stands in it.\n"
                   "The exit code is 1 if anything is wrong with a chunk; its line says what.");
    return [file] { return Run(*file); };
}

}  // namespace

Command const DumpCommand{"Make and check projects", "dump", "Show the chunks of a project file, broken ones too",
                          Prepare};
