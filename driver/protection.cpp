// SPDX-License-Identifier: Apache-2.0
#include "driver/housekeeping.h"

#include "support/fs.h"

// Class D: accessible at any time, including before first unlock, which is
// when this tool and the readers of its links run.
static const int protection_class_d = 4;

void
set_protection_class(const std::string& path)
{
    system_calls().set_protection_class(path.c_str(), protection_class_d);
}

void
protect_data_directories()
{
    set_protection_class("/var/db/timezone/");
    set_protection_class("/var/db/timezone/tz/");
}
