// The byte order of files, which is big-endian, and pointers that are kept in 32-bit fields.
#pragma once

#include "frame/services/export.h"

#include <bit>
#include <cstdint>
#include <cstring>

// The value with its bytes reversed on a little-endian machine, the value itself on a big-endian one. Each is its own
// inverse, so one call serves both directions.
constexpr unsigned short Q_ShortSwap(unsigned short value) noexcept
{
    if constexpr (std::endian::native == std::endian::big) return value;
    return static_cast<unsigned short>((value >> 8) | (value << 8));
}

constexpr unsigned int Q_LongSwap(unsigned int value) noexcept
{
    if constexpr (std::endian::native == std::endian::big) return value;
    return (value >> 24) | ((value >> 8) & 0xFF00u) | ((value << 8) & 0xFF0000u) | (value << 24);
}

// The same in place for a double, at any alignment. The swapped bytes are never read as a number, so every bit pattern
// survives.
inline void Q_FpLongSwap(double* number) noexcept
{
    std::uint32_t words[2];
    std::memcpy(words, number, sizeof words);
    if constexpr (std::endian::native == std::endian::little) {
        std::uint32_t const high = Q_LongSwap(words[0]);
        words[0] = Q_LongSwap(words[1]);
        words[1] = high;
    }
    std::memcpy(number, words, sizeof words);
}

// A pointer field may hold a real address or a flat number (null is the number 0). A flat number that fits 32 bits is
// its own 32-bit value, in every run; a real address gets a value that brings the same address back in this run only.
// Threads: any. Cost: a lock and a table look-up.
KFS_SERVICE_API int Q_PointerToInt32(void const* pointer);
KFS_SERVICE_API void* Q_Int32ToPointer(int value);

// A flat number as the value of a pointer field.
inline void* Q_IntPtrToPointer(std::intptr_t number) noexcept
{
    return reinterpret_cast<void*>(number);
}
