// SPDX-License-Identifier: Apache-2.0
// Makes the changes a tzlinks run made to the tree, and nothing else: the
// same unlink, symlink and record calls, in the same order, from a program
// that is otherwise empty. Timed beside tzlinks, it shows what those calls
// cost the kernel on this file system, which no change to the tool can
// take away.
//
// Usage: replay [unlink PATH | symlink TARGET PATH | record PATH TEXT]...
//   record opens, fstats, truncates (a file that is not empty), writes and
//   closes, as the tool writes its version diff record.
// Failures are ignored (an unlink of a missing entry costs what it costs);
// the exit status is 0 unless the arguments are malformed.
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

int
main(int argc, char** argv)
{
    for (int i = 1; i < argc;) {
        const char* op = argv[i];
        if (std::strcmp(op, "unlink") == 0 && i + 1 < argc) {
            (void)unlink(argv[i + 1]);
            i += 2;
        } else if (std::strcmp(op, "symlink") == 0 && i + 2 < argc) {
            (void)symlink(argv[i + 1], argv[i + 2]);
            i += 3;
        } else if (std::strcmp(op, "record") == 0 && i + 2 < argc) {
            int fd = open(argv[i + 1], O_WRONLY | O_CREAT | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC,
                          0666);
            if (fd >= 0) {
                struct stat st;
                if (fstat(fd, &st) == 0 && st.st_size > 0)
                    (void)ftruncate(fd, 0);
                (void)write(fd, argv[i + 2], std::strlen(argv[i + 2]));
                (void)close(fd);
            }
            i += 3;
        } else {
            return 64;
        }
    }
    return 0;
}
