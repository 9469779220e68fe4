#include "cli/command.h"
#include "cli/errors.h"
#include "cli/expressions.h"
#include "cli/options.h"
#include "cli/output.h"
#include "cli/projectoutput.h"
#include "frame/services/strings.h"
#include "host/expression.h"
#include "host/filebytes_private.h"
#include "host/storeerror.h"
#include "overrides/streamexpression.h"

#include <optional>

using kfshost::StreamItem;

namespace {

struct Options {
    Selection selection;
    std::string output;
    std::optional<std::string> expression;
    std::string expressionFile;
    bool enable = false;
    bool disable = false;
};

// The text that is asked for. One that can't be compiled is refused, so that it needn't be found out at the first read.
std::optional<std::string> ReadText(Options const& options)
{
    std::optional<std::string> text = options.expression;
    constexpr std::size_t most = std::size_t{1} << 20;  // more than any expression may have
    if (!options.expressionFile.empty()) {
        text = ReadingFile(
            options.expressionFile, [&] { return kfshost::ReadFileBytes(options.expressionFile, "", most); });
    }
    if (!text) return text;
    char const* const source = options.expression ? "--expression" : "--expression-file";
    if (Q_UTF16ToMBString(Q_MBToUTF16String(*text)) != *text) throw UserError(source, "isn't UTF-8");
    if (text->empty()) return text;
    if (auto const error = kfshost::CheckExpression(*text)) throw UserError(source, error->text);
    return text;
}

void CheckStream(StreamItem const& item, Options const& options)
{
    char const* reason = nullptr;
    if (kfshost::IsSeparated(*item.stream))
        reason = "is separated: its dimensions have the expressions then";
    else if (!item.stream->CanHaveExpression())
        reason = "can't have an expression";
    else if (!options.expression && options.expressionFile.empty() && !item.stream->HasExpression())
        reason = "has no expression";
    if (reason) throw UserError(options.selection.ShownFile() + ": " + item.path, reason);
}

void SetOn(KFS_Stream& stream, Options const& options, std::optional<std::string> const& text)
{
    if (text) KFS_SetStreamExpression(&stream, Q_MBToUTF16String(*text));
    if (options.enable || options.disable)
        kfshost::ThrowIfFailed(KFS_SetStreamExprFlags(&stream, KFS_ExprFlag_Disabled, options.disable ? ~0U : 0U));
}

std::string DoneText(Options const& options, std::optional<std::string> const& text, std::size_t count)
{
    std::string const streams = Plural(count, "stream", "streams");
    if (text && text->empty()) return "no expression on " + streams;
    std::string const state = options.disable ? ", switched off" : options.enable ? ", switched on" : "";
    return (text ? "expression set on " : "expression of ") + streams + state;
}

int Run(Options const& options)
{
    if (!options.expression && options.expressionFile.empty() && !options.enable && !options.disable)
        throw UserError("set", "nothing to set: --expression, --expression-file, --enable or --disable says what");
    RefuseToOverwrite(options.selection.file, options.output);
    auto const text = ReadText(options);
    kfshost::Scene scene = LoadScene(options.selection);
    auto const chosen = SelectStreams(scene, options.selection);
    for (StreamItem const* item : chosen) CheckStream(*item, options);
    for (StreamItem const* item : chosen) SetOn(*item->stream, options, text);
    std::string const done = DoneText(options, text, chosen.size());
    if (!scene.tree) scene = kfshost::TakeScene(kfshost::MakeTree(std::move(scene)));
    WriteProject(dynamic_cast<kfshost::SceneGroup const&>(*scene.tree), options.output, done);
    return ExitDone;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    options->selection.forSaving = true;
    command.add_option("FILE", options->selection.file, "a project, or a .gltf, .glb or .bvh file")->required();
    command
        .add_option("--stream", options->selection.glob,
                    "streams whose paths match this pattern, with * and ? (quote it)")
        ->required()
        ->type_name("GLOB");
    AddOutput(command, options->output, "the new project file", "PROJECT");
    CLI::Option* const text =
        command.add_option("--expression", options->expression, "what computes their values; '' takes it away")
            ->type_name("TEXT");
    command.add_option("--expression-file", options->expressionFile, "the same from a file; - for the standard input")
        ->type_name("FILE")
        ->excludes(text);
    CLI::Option* const enable = command.add_flag("--enable", options->enable, "switch their expressions on");
    command.add_flag("--disable", options->disable, "switch their expressions off, and keep the text")
        ->excludes(enable);
    AddTimeScale(command, options->selection.timeScale);
    command.footer(
        "An expression is written in Lua, like 'value * 2' or 'stream(\"walk/Hips/translation\", time - 0.5)'.\n"
        "One that can't be compiled is refused; what fails when it runs is told by who reads it.");
    return [options] { return Run(*options); };
}

}  // namespace

Command const SetCommand{"Make and check projects", "set", "Give streams an expression, or take it away", Prepare};
