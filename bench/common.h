#pragma once

// What several benchmarks need: the library, started once, and the search that ours is held against.

#include "host/session.h"

#include <stdexcept>
#include <string>
#include <vector>

// Never ended: streams and what is current on a thread go in an order of their own at exit.
inline kfshost::Session& Library()
{
    static kfshost::Session* const session = new kfshost::Session;
    return *session;
}

// For what isn't measured. What is measured ignores its code, so that the time is that of the call alone.
inline void Must(int code)
{
    if (code != 0) throw std::runtime_error("error " + std::to_string(code));
}

// The number of times before `time`. Branchless, over times packed side by side.
inline int Search(std::vector<int> const& times, int time)
{
    int const* base = times.data();
    auto count = static_cast<unsigned int>(times.size());
    while (count > 1) {
        unsigned int const half = count / 2;
        unsigned int const before = (static_cast<unsigned int>(base[half - 1]) - static_cast<unsigned int>(time)) >> 31;
        base += half & (0U - before);
        count -= half;
    }
    return static_cast<int>(base - times.data()) + (*base < time ? 1 : 0);
}
