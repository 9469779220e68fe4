#pragma once

#include <string>
#include <string_view>
#include <unordered_map>
#include <unordered_set>

namespace kfshost {

// A name from a file as text that can be shown and written anywhere: control characters and bytes that aren't UTF-8
// are escaped, \n, \t, \r and \x1b.
std::string CleanName(std::string_view name);

// The file's name without folder and last ending; "stdin" for "-".
std::string StemOf(std::string const& fileName);

// Hands out names of which no two are alike: a second "a" becomes "a#2".
class UniqueNames {
public:
    std::string Make(std::string const& wanted);

private:
    std::unordered_set<std::string> taken_;
    std::unordered_map<std::string, int> copies_;  // of a name that was wanted before: the last number tried
};

}  // namespace kfshost
