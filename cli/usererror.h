#pragma once

#include <stdexcept>
#include <string>

// What the command's user is told in place of a result: "kfs: " and this line on stderr, exit code 2.
class UserError : public std::runtime_error {
public:
    UserError(std::string const& subject, std::string const& what) : std::runtime_error(subject + ": " + what) {}
};
