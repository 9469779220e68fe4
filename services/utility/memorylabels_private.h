#pragma once

#include "frame/services/memory.h"

#include <atomic>
#include <cstdint>

// What is live under one label. Entries are made on first use and stay until the process ends.
class Q_MemoryLabel {
public:
    constexpr Q_MemoryLabel(std::uint64_t hash, char const* text) noexcept : hash_(hash), text_(text) {}

    void Add(std::size_t size) noexcept { Change(static_cast<long long>(size), 1); }
    void Remove(std::size_t size) noexcept { Change(-static_cast<long long>(size), -1); }
    Q_MemoryCount Live() const noexcept
    {
        return {bytes_.load(std::memory_order_relaxed), blocks_.load(std::memory_order_relaxed)};
    }

    std::uint64_t Hash() const noexcept { return hash_; }
    char const* Text() const noexcept { return text_; }

private:
    void Change(long long bytes, long long blocks) noexcept
    {
        bytes_.fetch_add(bytes, std::memory_order_relaxed);
        blocks_.fetch_add(blocks, std::memory_order_relaxed);
    }

    std::uint64_t hash_;
    char const* text_;
    std::atomic<long long> bytes_{0};
    std::atomic<long long> blocks_{0};
};

// The entry of a label, made if there is none; null counts as the empty text. Never null: once the table is full, or no
// memory is left for an entry, all new labels share one.
Q_MemoryLabel* Q_FindMemoryLabel(char const* label) noexcept;
