// SPDX-License-Identifier: Apache-2.0
#ifndef TZLINKS_SUPPORT_PREFIX_H
#define TZLINKS_SUPPORT_PREFIX_H

#include <cstring>
#include <string>

// Byte-wise "text begins with prefix"; a shorter text never does.
inline bool
has_prefix(const std::string& text, const char* prefix)
{
    return text.compare(0, std::strlen(prefix), prefix) == 0;
}

#endif
