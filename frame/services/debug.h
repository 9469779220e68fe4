// Switches for development, by name.
#pragma once

#include "frame/services/export.h"

#include <map>
#include <mutex>
#include <string>

namespace hearth::debug {

// Entries are texts. Empty at first: who wants a switch sets it before the code that reads it runs.
// Threads: any.
class KFS_SERVICE_API DebugDatabase {
public:
    static DebugDatabase& Instance();

    // Whether there is an entry of that name; if so and `value` isn't null, its text.
    bool GetEntry(char const* name, std::string* value) const;
    // The entry's meaning, or `fallback` without an entry or when its text has no such meaning.
    // bool: "1", "true", "yes", "on" and "0", "false", "no", "off", in lower case.
    template <class T>
    T GetEntryAs(char const* name, T fallback) const;

    // Sets an entry; a null value removes it.
    void SetEntry(char const* name, char const* value);

private:
    DebugDatabase() = default;

    mutable std::mutex mutex_;
    std::map<std::string, std::string, std::less<>> entries_;
};

template <>
KFS_SERVICE_API bool DebugDatabase::GetEntryAs<bool>(char const* name, bool fallback) const;

}  // namespace hearth::debug
