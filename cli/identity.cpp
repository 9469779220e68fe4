#include "cli/command.h"
#include "cli/errors.h"
#include "cli/identitytable.h"
#include "cli/options.h"
#include "cli/overridewords.h"
#include "cli/sampletimes.h"
#include "host/identities.h"
#include "host/storeerror.h"

#include <fmt/format.h>

#include <algorithm>
#include <stdexcept>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

// More than anybody keeps.
constexpr std::size_t MostIdentities = 10'000'000;

struct Options {
    Selection selection;
    SampleWords times;
    OverrideWords overrides;
    bool ofStreams = false;  // of each that is selected; else of the whole tree
    bool spans = false;      // from each time up to the next; else moments
    std::string earlier;
    TableFormat format = TableFormat::Table;
};

std::vector<std::string> ColumnsOf(std::vector<StreamItem const*> const& items, Options const& options)
{
    if (!options.ofStreams) return {std::string(WholeTree)};
    std::vector<std::string> columns;
    for (StreamItem const* item : items) columns.push_back(item->path);
    return columns;
}

int Compare(IdentityTable const& now, Options const& options, Output& output)
{
    auto const verdicts = CompareIdentities(now, ReadIdentities(options.earlier), options.earlier);
    WriteVerdicts(verdicts, *now.fps, options.format, output);
    bool const isSame = std::ranges::all_of(
        verdicts, [](IdentityVerdict const& verdict) { return verdict.state == IdentityVerdict::State::Same; });
    return isSame ? ExitDone : ExitFound;
}

void SetSpan(kfshost::Render& render, Rational const& start, Rational const& length)
try {
    render.SetSpan(start, Fitting(
                              "--step", [&] { return start + length; }));
} catch (std::length_error const& error) {
    throw UserError("--step", error.what());
}

int Run(Options const& options)
{
    auto const asked = AskedFps(options.times);
    kfshost::Scene const scene = LoadSceneInTree(options.selection);
    Overrides const overrides(scene, options.selection, options.overrides);
    auto const items = SelectStreams(scene, options.selection);
    Rational const fps = asked ? *asked : FindFps(items, options.selection);
    Rational const length = options.spans ? StepOf(options.times, fps) : Rational();
    std::vector<Rational> const times = SampleTimes(options.times, fps, SpanOf(items));
    IdentityTable table{fps, ColumnsOf(items, options), {}};
    if (table.columns.size() * times.size() > MostIdentities) {
        throw UserError("--stream", fmt::format("asks for {} identities, more than {}",
                                                table.columns.size() * times.size(), MostIdentities));
    }
    kfshost::Render render(overrides.WholeBag(), scene.timeScale);
    for (Rational const& time : times) {
        SetSpan(render, time, length);
        IdentityTable::Row row{{time, length}, {}};
        if (!options.ofStreams) row.identities.push_back(kfshost::TextOf(kfshost::IdentityOf(*scene.tree, render)));
        for (StreamItem const* item : options.ofStreams ? items : std::vector<StreamItem const*>())
            row.identities.push_back(
                kfshost::HasKeys(*item->stream) ? kfshost::TextOf(kfshost::IdentityOf(*item->stream, render)) : "");
        table.rows.push_back(std::move(row));
    }
    Output output;
    int code = ExitDone;
    if (options.earlier.empty())
        WriteIdentities(table, options.format, output);
    else
        code = Compare(table, options, output);
    output.Flush();
    return code;
}

TableFormat FormatNamed(std::string const& name)
{
    return name == "csv" ? TableFormat::Csv : name == "json" ? TableFormat::Json : TableFormat::Table;
}

Work Prepare(CLI::App& command)
{
    auto const options = std::make_shared<Options>();
    AddSelection(command, options->selection);
    AddSampleWords(command, options->times);
    AddStepWord(command, options->times);
    command.add_flag("--spans", options->spans,
                     "of all that is seen from each time up to the next (default: of the moments)");
    AddOverrideWords(command, options->overrides);
    command.add_option("--compare", options->earlier, "an earlier table, CSV or JSON: tell which times it has alike")
        ->type_name("EARLIER");
    command
        .add_option_function<std::string>(
            "--format", [options](std::string const& name) { options->format = FormatNamed(name); },
            "how to print (default: table)")
        ->check(CLI::IsMember({"table", "csv", "json"}))
        ->type_name("FORMAT");
    command.footer("An identity stands for all that the animation says at a time, or over a span: where it is the same "
                   "as before,\n"
                   "so is what is rendered of it. It is the same on every machine. With --stream each stream has one "
                   "of its own, else\n"
                   "all together have one. With --compare the exit code is 1 where anything is to be rendered anew.");
    return [options, &command] {
        options->ofStreams = command.count("--stream") > 0;
        return Run(*options);
    };
}

}  // namespace

Command const IdentityCommand{"Look into files", "identity",
                              "Print what tells whether frames look as they did before, for caches of rendered frames",
                              Prepare};
