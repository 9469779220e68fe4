#include "cli/sampletimes.h"

#include "cli/errors.h"
#include "cli/options.h"
#include "cli/output.h"
#include "host/framegrid.h"

#include <fmt/format.h>

#include <algorithm>

using kfshost::Rational;
using kfshost::StreamItem;

namespace {

constexpr std::int64_t MaxSamples = 1'000'000;

// The frame at or before a time.
std::int64_t FrameBefore(Rational const& seconds, Rational const& fps)
{
    Rational const frames = seconds * fps;
    std::int64_t const quotient = frames.Numerator() / frames.Denominator();
    return frames < Rational(quotient, 1) ? quotient - 1 : quotient;
}

// The option whose number makes times many, or odd.
char const* OptionOfRate(SampleWords const& words)
{
    return words.step.empty() ? "--fps" : "--step";
}

// Keys that aren't on the frames at which values are shown, where nobody asked for those frames.
void TellStrangers(kfshost::FrameGrid const& grid, Selection const& selection)
{
    if (grid.offGrid == 0) return;
    TellAbout(selection.file,
              fmt::format("{} of {} aren't frames of {} a second, but up to {:.2g} of a frame beside "
                          "them; --fps asks for another rate",
                          grid.offGrid, Plural(grid.times, "key time", "key times"), grid.rate.ToString(), grid.worst));
}

}  // namespace

void AddSampleWords(CLI::App& command, SampleWords& words)
{
    command
        .add_option("--from", words.from,
                    "first time: seconds like 0.5 or 1/24, or frames like 12f (default: the frame of the first key)")
        ->type_name("TIME");
    command.add_option("--to", words.to, "last time (default: the frame of the last key)")->type_name("TIME");
    command.add_option("--fps", words.fps, "samples a second, like 24 or 30000/1001 (default: the keys' rate)")
        ->type_name("RATE");
}

void AddStepWord(CLI::App& command, SampleWords& words)
{
    command.add_option("--step", words.step, "from one time to the next (default: a frame)")->type_name("TIME");
}

std::optional<Rational> AskedFps(SampleWords const& words)
{
    return words.fps.empty() ? std::nullopt : std::optional(ParseFps(words.fps));
}

Rational FindFps(std::vector<StreamItem const*> const& items, Selection const& selection)
{
    kfshost::FrameGrid const grid = kfshost::FindFrameGrid(items);
    TellStrangers(grid, selection);
    return grid.rate;
}

Rational StepOf(SampleWords const& words, Rational const& fps)
{
    if (words.step.empty()) return Rational(1, 1) / fps;
    Rational const step = ParseTime(words.step, "--step", fps);
    if (step <= Rational()) throw UserError("--step", TimeText(step) + " s doesn't lead from one time to a later one");
    return step;
}

std::vector<Rational> SampleTimes(SampleWords const& words, Rational const& fps, std::optional<TimeSpan> const& span)
{
    char const* const rateOption = OptionOfRate(words);
    TimeSpan const keys = span.value_or(TimeSpan{});
    Rational const from = words.from.empty()
                              ? Fitting("--fps", [&] { return Rational(FrameBefore(keys.first, fps), 1) / fps; })
                              : ParseTime(words.from, "--from", fps);
    Rational const to = words.to.empty() ? std::max(keys.last, from) : ParseTime(words.to, "--to", fps);
    if (words.to.empty() && span && from > keys.last) {
        throw UserError("--from", TimeText(from) + " s is after the last key, " + TimeText(keys.last) +
                                      " s; --to says how far to go then");
    }
    if (to < from) throw UserError("--to", TimeText(to) + " s is before --from, " + TimeText(from) + " s");
    Rational const rate = Fitting(
        rateOption, [&] { return Rational(1, 1) / StepOf(words, fps); });
    Rational const length = Fitting(
        words.from.empty() ? "--to" : "--from", [&] { return to - from; });
    Rational const steps = Fitting(rateOption, [&] { return length * rate; });
    bool const isBetween = words.to.empty() && steps.Denominator() != 1;
    std::int64_t const last = FrameBefore(length, rate) + (isBetween ? 1 : 0);
    if (last >= MaxSamples) {
        throw UserError(rateOption, fmt::format("asks for more than {} times from {} s to {} s", MaxSamples,
                                                TimeText(from), TimeText(to)));
    }
    std::vector<Rational> times;
    for (std::int64_t i = 0; i <= last; ++i)
        times.push_back(Fitting(rateOption, [&] { return from + Rational(i, 1) / rate; }));
    return times;
}
