// Commands and what they answer, as they stand in golden/*.txt. Behind a command come its standard output, indented; the
// standard error, each line behind "! "; the exit code behind "= ", but for 0; and behind "+ " each file that is new or
// another. "@/" is a folder with the files below, and each command finds them as they were. "< FILE" and "> FILE" are the
// standard input and output, "| marks" tells what a drawing is made of. Lines behind "# " are for the reader. With
// KFS_WRITE_GOLDEN set the answers are written anew.
#include "tests/cli/command.h"

#include <gtest/gtest.h>

#include <cmath>
#include <cstring>
#include <filesystem>
#include <map>
#include <sstream>
#include <utility>

namespace {

std::map<std::string, std::string> Inputs()
{
    std::string const project = RunKfs({"import", Sample, "-o", "-"}).output;
    auto const with = [&](std::size_t offset, std::string const& bytes) {
        return std::string(project).replace(offset, bytes.size(), bytes);
    };
    std::size_t const second = project.find("seql") + 16 + 128;  // a key of the translation, behind another
    return {{"project", project},
            {"apart", RunKfs({"separate", Sample, "--stream", "*/translation", "-o", "-"}).output},
            {"dragged", RunKfs({"drag", Sample, "--stream", "*/translation", "--component", "y", "--at", "1.1", "--to",
                                "-2.5", "-o", "-"})
                            .output},
            {"expressed", RunKfs({"set", Sample, "--stream", "*/translation", "--expression",
                                  "extend('cycle') + vec(0, frame, 0)", "-o", "-"})
                              .output},
            {"failing", RunKfs({"set", Sample, "--stream", "*/scale", "--expression",
                                "if time > 1 then\n  return missing.x\nend\nreturn value", "-o", "-"})
                            .output},
            {"double.lua", "-- twice\nreturn value * 2\n"},
            {"was.csv", RunKfs({"identity", Sample, "--step", "1/4", "--format", "csv"}).output},
            {"was.json",
             RunKfs({"identity", Sample, "--stream", "*", "--step", "1/4", "--to", "2", "--format", "json"}).output},
            {"half", project.substr(0, project.size() / 2)},
            {"cut3", project.substr(0, 3)},
            {"cut30", project.substr(0, 30)},
            {"endless", with(project.find("kfbs") - 4, "\x7F\xFF\xFF\xFF")},
            {"other_time", with(second, std::string("\0\0\0\1", 4))},
            {"other_value", with(second + 8, "\x40\x22")},
            {"other_speed", with(second + 8 + 24, "\x40\x59")},
            {"other_letter", with(project.find("khco") + 8, "a")},
            {"other_name", with(project.find("bounce"), "BOUNCE")},
            {"copy.gltf", FileContent(Sample)},
            {"old.svg", "an earlier drawing"},
            {"still.bvh", Motion({})},
            {"giant.bvh", Motion({"1e308 0 0", "-1e308 0 0"})},
            {"front.bvh", Motion({"0 0 0", "9 5 1"})},
            {"side.bvh", Motion({"0 0 0", "1 5 9"})},
            {"above.bvh", Motion({"0 0 0", "9 1 5"})},
            {"round.bvh", Motion({"0 0 0", "9 5 4"})},
            {"same.bvh", Motion({"7 0 0", "7 0 0"})},
            {"one.bvh", Motion({"1 2 3"})},
            {"steep.bvh", Motion({"1e12 1 0", "-1e12 1 0"}, "0.001")},
            {"flat.bvh", Motion({"1e-9 0 0", "0 1e-9 0"}, "1000")},
            {"empty.gltf", ""},
            {"short.gltf", "{\"asset\": {"},
            {"magic.glb", "GLTF and more bytes"},
            {"nothing.gltf", R"({"asset": {"version": "2.0"}})"},
            {"old.gltf", R"({"asset": {"version": "1.0"}})"},
            {"frames.bvh", "HIERARCHY\nROOT a\n{\n}\nMOTION\nFrames: x"},
            {"walk.txt", "ROOT"},
            {"walk", "HIERARCHY"}};
}

std::string Replaced(std::string text, std::string const& what, std::string const& by)
{
    for (std::size_t at = 0; (at = text.find(what, at)) != std::string::npos; at += by.size())
        text.replace(at, what.size(), by);
    return text;
}

// For each kind of element how many there are and the sum of their places, which hardly a fault leaves as it was; and all
// texts.
std::string MarksOf(std::string const& svg)
{
    std::map<std::string, std::pair<int, double>> kinds;
    std::string texts = "texts:";
    std::istringstream lines(svg);
    for (std::string line; std::getline(lines, line);) {
        std::string kind = line.substr(0, line.find_first_of(" >"));
        std::size_t at = kind.size(), numbers = 0;
        double sum = 0.0;
        for (std::size_t quote; (quote = line.find('"', at)) != std::string::npos;) {
            std::size_t const name = line.rfind(' ', quote) + 1, end = line.find('"', quote + 1);
            std::string value = line.substr(quote + 1, end - quote - 1);
            static std::set<std::string> const places{"x", "y", "x1", "y1", "x2", "y2", "cx", "cy", "points", "d"};
            if (places.contains(line.substr(name, quote - 1 - name))) {
                for (char& c : value)
                    if (std::string("0123456789.-").find(c) == std::string::npos) c = ' ';
                std::istringstream stream(value);
                for (double number = 0.0; stream >> number; ++numbers) sum += number;
                EXPECT_TRUE(stream.eof()) << line;
            } else {
                kind += line.substr(at, end + 1 - at);
            }
            at = end + 1;
        }
        std::size_t const close = std::min(line.find('>', at), line.size());
        if (line.starts_with("<text")) texts += " " + line.substr(close + 1, line.find("</", close) - close - 1) + ";";
        kind += line.substr(at, close + 1 - at) + (numbers > 8 ? " of " + std::to_string(numbers) + " numbers" : "");
        ++kinds[kind].first;
        kinds[kind].second += sum;
    }
    std::string marks;
    for (auto const& [kind, found] : kinds)
        marks += std::to_string(found.first) + " at " + std::to_string(std::llround(found.second)) + ": " + kind + '\n';
    return marks + texts + '\n';
}

class KfsTranscript : public testing::TestWithParam<char const*> {
protected:
    std::string Filled(std::string const& word) const
    {
        return Replaced(Replaced(Replaced(word, "@", root_), "SAMPLE", Sample), "\\n", "\n");
    }

    // The lines that a command is to be followed by.
    std::string Answer(std::string const& command)
    {
        std::vector<std::string> arguments;
        Streams streams;
        bool isDrawing = false;
        std::istringstream words(command);
        for (std::string word; words >> word;) {
            if (word != "<" && word != ">" && word != "|") {
                arguments.push_back(Filled(word));
                continue;
            }
            std::string const how = std::exchange(word, "");
            words >> word;
            isDrawing |= how == "|";
            if (how != "|") (how == "<" ? streams.input : streams.output) = Filled(word);
        }
        Outcome const outcome = RunKfs(arguments, streams);
        std::string answer;
        auto const tell = [&](std::string const& mark, std::string const& text) {
            std::istringstream lines(Replaced(Replaced(text, root_, "@"), Sample, "SAMPLE"));
            for (std::string line; std::getline(lines, line);) answer += mark + line + '\n';
        };
        tell("    ", isDrawing ? MarksOf(outcome.output) : outcome.output);
        tell("! ", outcome.errors);
        if (outcome.code != 0) tell("= ", std::to_string(outcome.code));
        for (std::string const& name : folder_.Names()) {
            auto const input = inputs_.find(name);
            if (input != inputs_.end() && FileContent(folder_.Path(name)) == input->second) continue;
            tell("+ ", name);
            std::filesystem::remove(folder_.Path(name));
        }
        for (auto const& [name, bytes] : inputs_)
            if (!std::filesystem::exists(folder_.Path(name))) folder_.Write(name, bytes);
        return answer;
    }

    std::map<std::string, std::string> const inputs_ = Inputs();
    ScratchFolder folder_;
    std::string const root_ = std::filesystem::path(folder_.Path("x")).parent_path();
};

TEST_P(KfsTranscript, IsWhatTheCommandsAnswer)
{
    for (auto const& [name, bytes] : inputs_) folder_.Write(name, bytes);
    std::istringstream golden(FileContent(kfstest::SourceFolder() / "tests/cli/golden" / GetParam()));
    std::string text;
    for (std::string line; std::getline(golden, line);) {
        bool const isCommand = line.starts_with("$ kfs");
        if (isCommand || line.empty() || line.starts_with("# ")) text += line + '\n';
        if (isCommand) text += Answer(line.substr(5));
    }
    ExpectGolden(GetParam(), text);
}

INSTANTIATE_TEST_SUITE_P(All, KfsTranscript,
                         testing::Values("looks.txt", "drawings.txt", "expressions.txt", "refusals.txt"),
                         [](auto const& test) { return std::string(test.param, std::strlen(test.param) - 4); });

}  // namespace
