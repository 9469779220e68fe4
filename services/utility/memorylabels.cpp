#include "services/utility/memorylabels_private.h"

#include <cstdlib>
#include <cstring>
#include <iterator>
#include <xxhash.h>

namespace {

// Open addressing. Slots go from null to an entry once and never back, so a search needs no lock.
constexpr std::size_t TableSize = 1024;
std::atomic<Q_MemoryLabel*> table[TableSize];

constinit Q_MemoryLabel overflow(0, "other labels");

// The entries found last, by the address of the label. Its text is compared all the same: an address may hold another
// one by now.
std::atomic<Q_MemoryLabel*> recent[64];

bool IsEntryOf(Q_MemoryLabel const& entry, std::uint64_t hash, char const* label) noexcept
{
    return entry.Hash() == hash && std::strcmp(entry.Text(), label) == 0;
}

// The text lies behind the entry in one block.
Q_MemoryLabel* MakeEntry(std::uint64_t hash, char const* label, std::size_t length) noexcept
{
    void* const memory = std::malloc(sizeof(Q_MemoryLabel) + length + 1);
    if (!memory) return nullptr;
    char* const text = static_cast<char*>(memory) + sizeof(Q_MemoryLabel);
    std::memcpy(text, label, length + 1);
    return new (memory) Q_MemoryLabel(hash, text);
}

// The entry of the label, or null with `*slot` the free place where it belongs; a null slot means a full table.
Q_MemoryLabel* Search(std::uint64_t hash, char const* label, std::atomic<Q_MemoryLabel*>** slot) noexcept
{
    *slot = nullptr;
    for (std::size_t i = 0; i < TableSize; ++i) {
        std::atomic<Q_MemoryLabel*>& place = table[(hash + i) % TableSize];
        Q_MemoryLabel* const entry = place.load(std::memory_order_acquire);
        if (!entry) {
            *slot = &place;
            return nullptr;
        }
        if (IsEntryOf(*entry, hash, label)) return entry;
    }
    return nullptr;
}

Q_MemoryLabel* FindOrMake(char const* label) noexcept
{
    std::size_t const length = std::strlen(label);
    std::uint64_t const hash = XXH3_64bits(label, length);
    Q_MemoryLabel* made = nullptr;
    Q_MemoryLabel* entry = nullptr;
    while (!entry) {
        std::atomic<Q_MemoryLabel*>* slot = nullptr;
        entry = Search(hash, label, &slot);
        if (entry) break;
        if (slot && !made) made = MakeEntry(hash, label, length);
        if (!slot || !made)
            entry = &overflow;
        else if (Q_MemoryLabel* none = nullptr; slot->compare_exchange_strong(none, made, std::memory_order_acq_rel))
            return made;
        // Another thread took the slot, perhaps for the same label: search again.
    }
    std::free(made);
    return entry;
}

}  // namespace

Q_MemoryLabel* Q_FindMemoryLabel(char const* label) noexcept
{
    if (!label) label = "";
    std::atomic<Q_MemoryLabel*>& last = recent[(reinterpret_cast<std::uintptr_t>(label) >> 3) % std::size(recent)];
    Q_MemoryLabel* entry = last.load(std::memory_order_acquire);
    if (entry && std::strcmp(entry->Text(), label) == 0) return entry;
    entry = FindOrMake(label);
    if (entry != &overflow) last.store(entry, std::memory_order_release);
    return entry;
}

Q_MemoryCount Q_MemoryLive(char const* label) noexcept
{
    if (label) {
        std::atomic<Q_MemoryLabel*>* slot = nullptr;
        Q_MemoryLabel const* const entry = Search(XXH3_64bits(label, std::strlen(label)), label, &slot);
        return entry ? entry->Live() : Q_MemoryCount{};
    }
    Q_MemoryCount total;
    auto const add = [](void* context, char const*, Q_MemoryCount const& count) {
        Q_MemoryCount& sum = *static_cast<Q_MemoryCount*>(context);
        sum.bytes += count.bytes;
        sum.blocks += count.blocks;
    };
    Q_ForEachMemoryLabel(add, &total);
    return total;
}

void Q_ForEachMemoryLabel(Q_MemoryVisitor visit, void* context)
{
    auto const visitEntry = [&](Q_MemoryLabel const& entry) {
        Q_MemoryCount const count = entry.Live();
        if (count != Q_MemoryCount{}) visit(context, entry.Text(), count);
    };
    for (std::atomic<Q_MemoryLabel*> const& place : table)
        if (Q_MemoryLabel const* const entry = place.load(std::memory_order_acquire)) visitEntry(*entry);
    visitEntry(overflow);
}
