#pragma once

#include <stdexcept>
#include <string>

namespace kfshost {

// An error code of the library, as an exception.
class StoreError : public std::runtime_error {
public:
    explicit StoreError(int code) : std::runtime_error("the library answers error " + std::to_string(code)), code_(code)
    {}
    [[nodiscard]] int Code() const noexcept { return code_; }

private:
    int code_;
};

inline void ThrowIfFailed(int code)
{
    if (code != 0) throw StoreError(code);
}

}  // namespace kfshost
