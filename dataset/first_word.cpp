// SPDX-License-Identifier: Apache-2.0
#include "dataset/first_word.h"

#include "support/fs.h"

#include <cerrno>
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

int
first_word_of(int fd, std::string& word, size_t keep)
{
    bool more = true;
    char buffer[4096];
    ssize_t n = 0;
    while (more && (n = read(fd, buffer, sizeof buffer)) > 0) {
        for (ssize_t i = 0; more && i < n; ++i) {
            if (!is_space(buffer[i]))
                word += buffer[i];
            else
                more = word.empty();
            more = more && word.size() <= keep;
        }
    }
    return n < 0 ? errno : 0;
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
    int error = fstat(fd, &st) != 0                          ? errno
                : S_ISREG(st.st_mode) || S_ISDIR(st.st_mode) ? first_word_of(fd, word, keep)
                                                             : 0;
    if (error != 0 && error != EISDIR)
        system_calls().io_failed(path, error);
    (void)close(fd);
    if (!word.empty())
        target = word;
}
