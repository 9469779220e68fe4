#include "host/framegrid.h"

#include "host/storeerror.h"
#include "host/timescale.h"
#include "keystore/lookup.h"

#include <algorithm>
#include <cmath>
#include <set>
#include <utility>

namespace kfshost {

namespace {

constexpr double Near = 1e-3;

// In units of 1/`scale`.
struct KeyTimes {
    unsigned int scale;
    std::set<int> units;
};

std::vector<KeyTimes> CollectTimes(std::vector<StreamItem const*> const& items)
{
    std::vector<KeyTimes> all;
    for (StreamItem const* item : items) {
        unsigned int const scale = item->stream->GetTimeScale();
        auto times = std::ranges::find(all, scale, &KeyTimes::scale);
        if (times == all.end()) times = all.insert(all.end(), KeyTimes{scale, {}});
        for (KFS_Stream const* stream : MoversOf(*item->stream)) {
            for (int i = 0; i < KeyCount(*stream); ++i) {
                T_Time time{};
                ThrowIfFailed(KFS_IndexToTime(stream, i, &time));
                times->units.insert(times->units.end(), time.value);
            }
        }
    }
    return all;
}

struct Place {
    double frames;  // from the nearest frame
    bool isOn;
};

// A scale with few units a frame rounds frames far; in it only what is exact counts.
Place PlaceOf(int units, unsigned int scale, FrameRate const& rate)
{
    double const frames = static_cast<double>(units) / scale * rate.numerator / rate.denominator;
    double const nearest = std::round(frames);
    double const offset = std::abs(frames - nearest);
    double const unitsOff = offset * rate.denominator / rate.numerator * scale;
    bool const isFine = scale > 8.0 * rate.numerator / rate.denominator;
    return {offset, isFine ? unitsOff <= 0.5 + 1e-6 : unitsOff <= 1e-6};
}

std::size_t CountStrangers(std::vector<KeyTimes> const& all, FrameRate const& rate)
{
    std::size_t count = 0;
    for (KeyTimes const& times : all) {
        count += static_cast<std::size_t>(std::ranges::count_if(
            times.units,
            [&](int units) {
                Place const place = PlaceOf(units, times.scale, rate);
                return place.frames > Near && !place.isOn;
            }));
    }
    return count;
}

}  // namespace

FrameGrid FindFrameGrid(std::vector<StreamItem const*> const& items)
{
    std::vector<KeyTimes> const all = CollectTimes(items);
    FrameGrid grid;
    for (KeyTimes const& times : all) grid.times += times.units.size();
    FrameRate best = UsualRates[0];
    std::size_t fewest = grid.times / 2 + 1;
    for (FrameRate const& rate : UsualRates) {
        std::size_t const strangers = CountStrangers(all, rate);
        if (strangers >= fewest) continue;
        fewest = strangers;
        best = rate;
    }
    grid.rate = best.ToRational();
    for (KeyTimes const& times : all) {
        for (int const units : times.units) {
            Place const place = PlaceOf(units, times.scale, best);
            if (place.isOn) continue;
            ++grid.offGrid;
            grid.worst = std::max(grid.worst, place.frames);
        }
    }
    return grid;
}

}  // namespace kfshost
