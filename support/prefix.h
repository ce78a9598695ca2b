#ifndef TZLINKS_SUPPORT_PREFIX_H
#define TZLINKS_SUPPORT_PREFIX_H

#include <string>

// Byte-wise "text begins with prefix"; a shorter text never does.
inline bool
has_prefix(const std::string& text, const std::string& prefix)
{
    return text.compare(0, prefix.size(), prefix) == 0;
}

#endif
