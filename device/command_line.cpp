// SPDX-License-Identifier: Apache-2.0
#include "status/command_line.h"

#include <cstdio>
#include <err.h>

int
usage_error(const char* usage, const char* why, const std::string& word)
{
    warnx("%s: %s", why, word.c_str());
    (void)fputs(usage, stderr);
    return 64;
}

int
written(int status)
{
    if (fflush(stdout) == 0 && ferror(stdout) == 0)
        return status;
    warn("cannot write the report");
    return 74;
}
