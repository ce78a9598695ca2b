// SPDX-License-Identifier: Apache-2.0
// tzlinks: at boot, chooses the time-zone dataset the device uses and
// expresses the choice as symbolic links in /var/db/timezone/.
#include "driver/startup.h"

int
main()
{
    // Arguments are ignored: the tool has nothing to configure.
    return run_startup_sequence();
}
