#include "cli/options.h"

#include "cli/usererror.h"

#include <fmt/format.h>

#include <charconv>
#include <climits>

namespace {

CLI::Validator TimeScaleCheck()
{
    return CLI::Validator(
        [](std::string const& text) -> std::string {
            unsigned int scale = 0;
            auto const [end, error] = std::from_chars(text.data(), text.data() + text.size(), scale);
            bool const isScale = error == std::errc() && end == text.data() + text.size() && scale > 0;
            return isScale ? "" : fmt::format("{} isn't a whole number from 1 to {}", text, UINT_MAX);
        },
        "");
}

}  // namespace

void AddTimeScale(CLI::App& command, unsigned int& timeScale)
{
    command
        .add_option("--time-scale", timeScale,
                    "hold times in this many units a second (default: chosen so that key times are exact)")
        ->check(TimeScaleCheck())
        ->type_name("N");
}

void AddSelection(CLI::App& command, Selection& selection)
{
    command.add_option("FILE", selection.file, "a project, or a .gltf, .glb or .bvh file")->required();
    command
        .add_option("--stream", selection.glob, "only streams whose path matches this pattern, with * and ? (quote it)")
        ->type_name("GLOB")
        ->capture_default_str();
    AddTimeScale(command, selection.timeScale);
    command
        .add_option_function<std::string>(
            "--as", [&selection](std::string const& name) { selection.asPaths = name == "spatial"; },
            "spatial: hold positions as paths, with one speed graph each (default: plain)")
        ->check(CLI::IsMember({"plain", "spatial"}))
        ->type_name("FORM");
    command.add_flag("--rove", selection.roving,
                     "with --as spatial: let all keys but the first and the last float, which smooths the speed");
}

CLI::Option* AddOutput(CLI::App& command, std::string& output, std::string const& what, std::string const& typeName)
{
    return command.add_option("-o,--output", output, what)->required()->type_name(typeName);
}

kfshost::Rational ParseFps(std::string const& text)
{
    auto const fps = kfshost::Rational::Parse(text);
    if (!fps || *fps <= kfshost::Rational())
        throw UserError("--fps", '"' + text + "\" isn't a number of frames a second like 24 or 30000/1001");
    return *fps;
}
