#include "cli/options.h"

#include <fmt/format.h>

#include <charconv>
#include <climits>
#include <cmath>
#include <cstdio>

using kfshost::Rational;

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

CLI::Validator NumberCheck(double least, double most)
{
    return CLI::Validator(
        [least, most](std::string const& text) -> std::string {
            double number = 0.0;
            auto const [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
            bool const isNumber = error == std::errc() && end == text.data() + text.size();
            if (isNumber && least <= number && number <= most) return "";
            return fmt::format("\"{}\" isn't a number {}", text,
                               std::isinf(most) ? fmt::format("of {} or more", least)
                                                : fmt::format("from {} to {}", least, most));
        },
        "");
}

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

Rational ParseFps(std::string const& text)
{
    auto const fps = Rational::Parse(text);
    if (!fps || *fps <= Rational())
        throw UserError("--fps", '"' + text + "\" isn't a number of frames a second like 24 or 30000/1001");
    for (int const whole : {24, 30, 48, 60, 120}) {
        Rational const exact(whole * 1000, 1001);
        if (*fps != exact && std::abs(fps->ToDouble() - exact.ToDouble()) < 0.005)
            std::fprintf(stderr, "kfs: --fps %s is taken as it stands; the exact rate near it is %s\n", text.c_str(),
                         exact.ToString().c_str());
    }
    return *fps;
}

Rational ParseTime(std::string const& text, char const* option, Rational const& fps)
{
    bool const inFrames = text.ends_with('f');
    auto const number = Rational::Parse(std::string_view(text).substr(0, text.size() - (inFrames ? 1 : 0)));
    if (!number) throw UserError(option, '"' + text + "\" isn't a time: seconds like 0.5 or 1/24, or frames like 12f");
    return inFrames ? Fitting(option, [&] { return *number / fps; }) : *number;
}
