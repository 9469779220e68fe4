#pragma once

#include "frame/services/strings.h"

#include <string>

inline u16str Text(std::string const& text)
{
    return Q_MBToUTF16String(text);
}
