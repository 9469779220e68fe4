#pragma once

#include <vector>

// The results of many calls, to hold against the one that all of them must have.
template <class... Results>
std::vector<int> Codes(Results... results)
{
    return {results...};
}
