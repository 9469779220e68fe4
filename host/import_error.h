#pragma once

#include <stdexcept>
#include <string>

namespace kfshost {

// Why a file can't be read: one line that names the place in the file and what is wrong there.
class ImportError : public std::runtime_error {
public:
    // `place`: where in the file, like "animations[0].channels[2]" or "line 17". May be empty: the file as a whole.
    ImportError(std::string const& place, std::string const& what)
        : std::runtime_error(place.empty() ? what : place + ": " + what)
    {}
};

}  // namespace kfshost
