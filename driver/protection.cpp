#include "driver/housekeeping.h"

#include <fcntl.h>
#include <unistd.h>

// Class D: accessible at any time, including before first unlock, which is
// when this tool and the readers of its links run.
static const int protection_class_d = 4;

void
set_protection_class(const std::string& path)
{
    int fd = open(path.c_str(), O_RDONLY | O_CLOEXEC);
    if (fd < 0)
        return;
#ifdef F_SETPROTECTIONCLASS
    (void)fcntl(fd, F_SETPROTECTIONCLASS, protection_class_d);
#else
    // No data-protection classes on this platform: nothing to set, and the
    // open and close above still show whether the directory is there.
    (void)protection_class_d;
#endif
    (void)close(fd);
}

void
protect_data_directories()
{
    set_protection_class("/var/db/timezone/");
    set_protection_class("/var/db/timezone/tz/");
}
