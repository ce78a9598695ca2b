// SPDX-License-Identifier: Apache-2.0
#include "device/command_line.h"

#include <cstdio>
#include <cstring>
#include <err.h>
#include <sysexits.h>

int
usage_error(const char* usage, const char* why, const std::string& word)
{
    warnx("%s: %s", why, word.c_str());
    (void)fputs(usage, stderr);
    return EX_USAGE;
}

int
written(int status)
{
    if (fflush(stdout) == 0 && ferror(stdout) == 0)
        return status;
    warn("cannot write the report");
    return EX_IOERR;
}

// Whether the word names one of the options exactly: getopt_long would
// take "--js" for "--json", which a script should never come to rely on.
static bool
exact(const char* word, const option* options)
{
    size_t length = strcspn(word + 2, "=");
    for (const option* o = options; o->name != nullptr; ++o) {
        if (strlen(o->name) == length && strncmp(o->name, word + 2, length) == 0)
            return true;
    }
    return false;
}

int
read_options(int argc, char** argv, const option* options, const char* usage,
             std::map<std::string, std::string>& given)
{
    for (int i = 1; i < argc && strcmp(argv[i], "--") != 0; ++i) {
        if (strncmp(argv[i], "--", 2) == 0 && !exact(argv[i], options))
            return usage_error(usage, "unknown argument", argv[i]);
    }
    opterr = 0;
    for (int c, index = 0; (c = getopt_long(argc, argv, ":h", options, &index)) != -1;) {
        std::string name = c == 'h' ? "help" : c == 0 ? options[index].name : "";
        if (c == '?')
            return usage_error(usage, "unknown argument", argv[optind - 1]);
        if (c == ':' || (optarg != nullptr && *optarg == '\0'))
            return usage_error(usage,
                               strcmp(argv[optind - 1], "--root") == 0 ? "missing directory after"
                                                                       : "missing value after",
                               argv[optind - 1]);
        if (given.count(name) != 0)
            return usage_error(usage, "given twice", "--" + name);
        given[name] = optarg != nullptr ? optarg : "";
    }
    return 0;
}
