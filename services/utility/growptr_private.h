#pragma once

#include <cstddef>

// Gives a block of Q_AllocatePtr more room, in its place where that is possible. Null, and the block as it was, when
// memory is out.
[[nodiscard]] void* Q_GrowPtr(void* block, std::size_t size) noexcept;
