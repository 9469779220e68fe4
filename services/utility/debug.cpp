#include "frame/services/debug.h"

#include <algorithm>
#include <array>
#include <string_view>

namespace hearth::debug {

namespace {

constexpr std::array<std::string_view, 4> TrueTexts = {"1", "true", "yes", "on"};
constexpr std::array<std::string_view, 4> FalseTexts = {"0", "false", "no", "off"};

}  // namespace

DebugDatabase& DebugDatabase::Instance()
{
    static DebugDatabase* const database = new DebugDatabase;  // never destroyed: read until the very end
    return *database;
}

bool DebugDatabase::GetEntry(char const* name, std::string* value) const
{
    std::lock_guard<std::mutex> const lock(mutex_);
    auto const entry = entries_.find(std::string_view(name));
    if (entry == entries_.end()) return false;
    if (value) *value = entry->second;
    return true;
}

template <>
bool DebugDatabase::GetEntryAs<bool>(char const* name, bool fallback) const
{
    std::string value;
    if (!GetEntry(name, &value)) return fallback;
    if (std::find(TrueTexts.begin(), TrueTexts.end(), value) != TrueTexts.end()) return true;
    if (std::find(FalseTexts.begin(), FalseTexts.end(), value) != FalseTexts.end()) return false;
    return fallback;
}

void DebugDatabase::SetEntry(char const* name, char const* value)
{
    std::lock_guard<std::mutex> const lock(mutex_);
    if (value)
        entries_.insert_or_assign(name, value);
    else
        entries_.erase(name);
}

}  // namespace hearth::debug
