#include "cli/projectoutput.h"

#include "cli/output.h"

#include <vector>

void WriteProject(kfshost::SceneGroup const& tree, std::string const& output, std::string const& what)
{
    if (output == "-") {
        std::vector<unsigned char> const bytes = kfshost::SaveProjectToMemory(tree, "standard output");
        WriteToStandardOutput({reinterpret_cast<char const*>(bytes.data()), bytes.size()});
        return;
    }
    kfshost::SaveProject(tree, output);
    if (!what.empty()) WriteToStandardOutput(Shown(output) + ": " + what + '\n', Shown(output) + " was saved");
}
