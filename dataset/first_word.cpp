// SPDX-License-Identifier: Apache-2.0
#include "dataset/first_word.h"

#include "support/fs.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

// The classic locale's white space; bytes of 0x80 and above are part of
// the word.
static bool
is_space(char c)
{
    return c == ' ' || (c >= '\t' && c <= '\r');
}

void
read_first_word(const std::string& path, std::string& target, size_t keep)
{
    // Never blocking: a FIFO without a writer would stop the boot for ever.
    int fd = system_calls().open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (fd < 0)
        return;
    // Only a regular file is read: a FIFO or a device may never end its
    // word. A directory is read too, which fails at once with EISDIR; that
    // is what errno says in the messages that follow.
    struct stat st;
    std::string word;
    bool more = fstat(fd, &st) == 0 && (S_ISREG(st.st_mode) || S_ISDIR(st.st_mode));
    char buffer[4096];
    for (ssize_t n = 0; more && (n = read(fd, buffer, sizeof buffer)) > 0;) {
        for (ssize_t i = 0; more && i < n; ++i) {
            if (!is_space(buffer[i]))
                word += buffer[i];
            else
                more = word.empty();
            more = more && word.size() <= keep;
        }
    }
    (void)close(fd);
    if (!word.empty())
        target = word;
}
