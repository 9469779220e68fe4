// Everything that the command refuses: one line, an exit code, and no file changed or left.
#include "tests/cli/command.h"

#include <gtest/gtest.h>

#include <map>

namespace {

// `error`: what stands behind "kfs: ". "@" is the folder of the files, "SAMPLE" the sample's path.
struct Refusal {
    std::vector<std::string> arguments;
    std::string error;
    char const* output = "";  // where the standard output goes
};

std::string Filled(std::string text, std::string const& folder)
{
    for (auto const& [mark, path] : {std::pair{std::string("@"), folder}, std::pair{std::string("SAMPLE"), Sample}})
        for (std::size_t at = 0; (at = text.find(mark, at)) != std::string::npos; at += path.size())
            text.replace(at, mark.size(), path);
    return text;
}

constexpr char const* Help = " (kfs --help tells what there is)";
constexpr char const* Missing = "can't be opened: No such file or directory";
constexpr char const* NoFps = "isn't a number of frames a second like 24 or 30000/1001";
constexpr char const* NoPosition = "SAMPLE: the chosen stream isn't a position in 2 or 3 dimensions";

std::vector<Refusal> Refusals()
{
    std::string const help = Help;
    std::string const missing = Missing;
    return {
        {{}, "A subcommand is required" + help},
        {{"draw"}, "there is no command \"draw\"" + help},
        {{"info"}, "FILE is required" + help},
        {{"info", "SAMPLE", "--nothing"}, "The following argument was not expected: --nothing" + help},
        {{"info", "SAMPLE", "--time-scale", "-5"}, "--time-scale: -5 isn't a whole number from 1 to 4294967295" + help},
        {{"plot", "SAMPLE"}, "--output is required" + help},
        {{"eval", "SAMPLE", "--format", "xml"}, "--format: xml not in {table,csv,json}" + help},
        {{"eval", "SAMPLE", "--as", "curves"}, "--as: curves not in {plain,spatial}" + help},

        {{"info", "@/gone.glb"}, "@/gone.glb: " + missing},
        {{"info", "@/gone.kfs"}, "@/gone.kfs: " + missing},
        {{"info", "@/a\nb.gltf"}, "@/a\\nb.gltf: " + missing},
        {{"dump", "@/gone"}, "@/gone: " + missing},
        {{"info", "@/project", "--time-scale", "25"},
         "--time-scale: a project has the times with which it was imported"},
        {{"import", "@/project", "-o", "@/x.svg"}, "@/project: this is a project already"},
        {{"import", "@/copy.gltf", "-o", "@/copy.gltf"}, "-o: \"@/copy.gltf\" is the file that is read"},
        {{"plot", "@/copy.gltf", "-o", "@/copy.gltf"}, "-o: \"@/copy.gltf\" is the file that is read"},
        {{"import", "SAMPLE", "-o", "@/project"},
         "standard output: can't be written: No space left on device (@/project was saved)",
         "/dev/full"},

        {{"separate", "SAMPLE", "-o", "@/x.svg"}, "--stream is required" + help},
        {{"separate", "SAMPLE", "--stream", "*", "-o", "@/x.svg"},
         "SAMPLE: bounce/ball/rotation: isn't of a kind whose dimensions can be separated"},
        {{"separate", "@/apart", "--stream", "*/translation", "-o", "@/x.svg"},
         "@/apart: bounce/ball/translation: is separated already"},
        {{"separate", "@/still.bvh", "--stream", "*", "-o", "@/x.svg"},
         "@/still.bvh: motion/a/translation: has neither keys nor a value"},
        {{"join", "@/project", "--stream", "*/translation", "-o", "@/x.svg"},
         "@/project: bounce/ball/translation: isn't separated"},
        {{"join", "@/apart", "--stream", "*/translation/y", "-o", "@/x.svg"},
         "@/apart: bounce/ball/translation/y: is one dimension of a stream, not the whole"},

        {{"eval", "SAMPLE", "--from", "soon"},
         "--from: \"soon\" isn't a time: seconds like 0.5 or 1/24, or frames like 12f"},
        {{"eval", "SAMPLE", "--from", "2", "--to", "1"}, "--to: 1 s is before --from, 2 s"},
        {{"eval", "SAMPLE", "--fps", "0"}, std::string("--fps: \"0\" ") + NoFps},
        {{"eval", "SAMPLE", "--fps", "1000000"}, "--fps: asks for more than 1000000 times from 0 s to 5/2 s"},
        {{"eval", "SAMPLE", "--fps", "9223372036854775807"},
         "--fps: leads to times that don't fit fractions of 64 bits"},
        {{"eval", "SAMPLE", "--fps", "1/9223372036854775807", "--to", "2f"},
         "--to: leads to times that don't fit fractions of 64 bits"},
        {{"eval", "SAMPLE", "--rate", "--euler", "XYZ"},
         "--rate: tells the rates of a rotation's components, so it can't go with --euler"},
        {{"eval", "SAMPLE", "--rove"}, "--rove: only paths have keys that can float: add --as spatial"},
        {{"eval", "SAMPLE", "--as", "spatial", "--stream", "*/scale"}, NoPosition},
        {{"eval", "SAMPLE"}, "standard output: can't be written: No space left on device", "/dev/full"},

        {{"drag", "SAMPLE", "--at", "1.1", "--to", "1", "-o", "@/x"},
         "--stream: * matches 3 streams, and one is dragged at a time: bounce/ball/translation, bounce/ball/rotation "
         "and "
         "more"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--at", "9", "--to", "1", "-o", "@/x"},
         "--at: 9 s isn't between the first key, 0 s, and the last, 5/2 s"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--at", "0f", "--to", "1", "-o", "@/x"},
         "--at: a key stands at 0 s; curves are dragged between keys"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--at", "1.1", "--to", "1,2", "-o", "@/x"},
         "--to: 2 values are given, and 3 asked for: x,y,z; --component drags one alone"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--component", "q", "--at", "1.1", "--to", "1", "-o", "@/x"},
         "--component: the stream has no q, but x, y, z"},
        {{"drag", "SAMPLE", "--stream", "*/rotation", "--at", "1.1", "--to", "1", "-o", "@/x"},
         "bounce/ball/rotation: is a rotation, whose components mean something together only"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--path", "--at", "1.1", "--to", "1,2", "-o", "@/x"},
         "--path: bounce/ball/translation isn't held as a path in two dimensions"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--as", "spatial", "--at", "1.1", "--to", "1,2,3", "-o",
          "@/x"},
         "bounce/ball/translation: is held as a path, and only those in two dimensions can be dragged"},
        {{"drag", "SAMPLE", "--stream", "*/translation", "--component", "y", "--at", "1.1", "--to", "1e308", "-o",
          "@/x"},
         "--to: no handles between these two keys carry the curve there"},

        {{"plot", "SAMPLE", "--fps", "nope", "-o", "@/x.svg"}, std::string("--fps: \"nope\" ") + NoFps},
        {{"plot", "SAMPLE", "-o", "@/x.png"},
         "-o: \"@/x.png\" is no name for an SVG file, and no other kind is written; rsvg-convert makes others of one"},
        {{"plot", "SAMPLE", "--stream", "nothing", "-o", "@/old.svg"},
         "SAMPLE: --stream nothing: none of the 3 streams has such a path (kfs info lists them)"},
        {{"plot", "SAMPLE", "-o", "@/none/x.svg"}, "@/none/x.svg: can't be written: No such file or directory"},
        {{"plot", "SAMPLE", "-o", "/dev/full"}, "/dev/full: can't be written: No space left on device"},
        {{"plot", "@/giant.bvh", "-o", "@/x.svg"},
         "@/giant.bvh: motion/a/translation: the numbers are too large to draw"},
        {{"plot", "@/still.bvh", "-o", "@/x.svg"}, "@/still.bvh: the chosen streams have no keys to draw"},
        {{"plot", "--motion", "SAMPLE", "--as", "plain", "-o", "@/x.svg"},
         "--motion: draws paths, so it can't go with --as plain"},
        {{"plot", "--motion", "SAMPLE", "--stream", "*/rotation", "-o", "@/x.svg"}, NoPosition},
        {{"plot", "--motion", "@/still.bvh", "-o", "@/x.svg"}, "@/still.bvh: the chosen streams have no keys to draw"},
        {{"plot", "--motion", "@/giant.bvh", "-o", "@/x.svg"},
         "@/giant.bvh: joints[0]: positions are too far apart for a path"},
    };
}

// Files that no command can use, by name.
struct BadFile {
    char const* name;
    char const* bytes;
    char const* error;
};

constexpr BadFile BadFiles[] = {
    {"empty.gltf", "", "line 1, column 1: the JSON text ends too early"},
    {"short.gltf", "{\"asset\": {", "line 1, column 12: the JSON text ends too early"},
    {"magic.glb", "GLTF and more bytes", "header: this isn't a binary glTF file"},
    {"nothing.gltf", R"({"asset": {"version": "2.0"}})", "nothing is animated"},
    {"old.gltf", R"({"asset": {"version": "1.0"}})", "asset.version: is \"1.0\"; versions 2.x are supported"},
    {"walk.bvh", "HIERARCHY\nROOT a\n{\n}\nMOTION\nFrames: x", "line 6: \"x\" isn't a count of frames"},
    {"walk.txt", "ROOT",
     "begins neither as a project nor as glTF or BVH, and its name doesn't end in .gltf, .glb or .bvh"},
    {"walk", "HIERARCHY", "line 1: the file ends where ROOT should be"},
};

}  // namespace

TEST(KfsFailures, AreOneLineAndCodeTwoAndChangeNothing)
{
    ScratchFolder const folder;
    std::string const project = RunKfs({"import", Sample, "-o", "-"}).output;
    std::vector<Refusal> refusals = Refusals();
    std::map<std::string, std::string> files{
        {"project", project},
        {"apart", RunKfs({"separate", Sample, "--stream", "*/translation", "-o", "-"}).output},
        {"copy.gltf", FileContent(Sample)},
        {"old.svg", "an earlier drawing"},
        {"still.bvh", Motion({})},
        {"giant.bvh", Motion({"1e308 0 0", "-1e308 0 0"})}};
    for (BadFile const& bad : BadFiles) {
        std::string const file = std::string("@/") + bad.name;
        files[bad.name] = bad.bytes;
        for (std::vector<std::string> const& command :
             {std::vector<std::string>{"info", file}, {"eval", file}, {"plot", file, "-o", "@/x.svg"}})
            refusals.push_back({command, file + ": " + bad.error});
    }
    std::set<std::string> names;
    for (auto const& [name, bytes] : files) {
        folder.Write(name, bytes);
        names.insert(name);
    }
    std::string const root = folder.Path("gone").substr(0, folder.Path("gone").size() - 5);
    for (Refusal const& refusal : refusals) {
        std::vector<std::string> arguments;
        for (std::string const& argument : refusal.arguments) arguments.push_back(Filled(argument, root));
        SCOPED_TRACE(refusal.error);
        Outcome const outcome = RunKfs(arguments, refusal.output);
        EXPECT_EQ(2, outcome.code);
        EXPECT_EQ("", outcome.output);
        EXPECT_EQ("kfs: " + Filled(refusal.error, root) + '\n', outcome.errors);
        EXPECT_EQ(names, folder.Names());
        for (auto const& [name, bytes] : files) EXPECT_TRUE(bytes == FileContent(folder.Path(name))) << name;
    }
    Outcome const half = RunKfs({"info", folder.Write("half", project.substr(0, project.size() / 2))});
    EXPECT_EQ(2, half.code);
    EXPECT_TRUE(half.errors.starts_with("kfs: " + folder.Path("half") + ": ")) << half.errors;
    EXPECT_EQ(1U, Count(half.errors, "\n")) << half.errors;
}
