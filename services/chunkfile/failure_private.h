#pragma once

#include <cstddef>
#include <cstdint>

// Writes "can't <what> "<path>": <the system's text for an errno value>", as far as it fits.
void CKFp_DescribeIo(char* text, std::size_t size, int error, char const* what, char const* path) noexcept;

// The first failure of a file, kept without memory of its own.
class CKFp_Failure {
public:
    [[nodiscard]] int Code() const noexcept { return code_; }
    char const* Text() const noexcept { return text_; }
    std::uint64_t Offset() const noexcept { return offset_; }

    // Takes a failure unless there is one already, and returns the one that counts.
    [[nodiscard]] [[gnu::format(printf, 4, 5)]] int Set(int code, std::uint64_t offset, char const* format,
                                                        ...) noexcept;
    // The same for an errno value.
    [[nodiscard]] int SetIo(int error, std::uint64_t offset, char const* what, char const* path) noexcept;
    [[nodiscard]] int SetOutOfMemory(std::uint64_t offset) noexcept;
    // For what was asked for under an id that only lists have, or none.
    [[nodiscard]] int SetBadAtomId(int id, std::uint64_t offset) noexcept;

private:
    int code_ = 0;
    std::uint64_t offset_ = 0;
    char text_[512] = "";
};

// An id in quotes for a message; what isn't printable is given as "?".
struct CKFp_IdText {
    explicit CKFp_IdText(int id) noexcept;
    char text[5];
};
