// SPDX-License-Identifier: Apache-2.0
// The commands of repairs: changes made as a person at the shell would
// make them. The shell text is what a report shows; apply() makes the
// same change to a simulation.
#ifndef TZLINKS_STATUS_COMMANDS_H
#define TZLINKS_STATUS_COMMANDS_H

#include "device/simulation.h"

#include <string>
#include <vector>

struct velm_command {
    enum verb_t {
        symlink_to,   // ln -sfn FIRST SECOND
        remove_entry, // rm -f FIRST
        remove_tree,  // rm -rf FIRST
        make_dirs,    // mkdir -p FIRST
        copy_tree,    // cp -a FIRST SECOND (a directory), unless SECOND exists
        move_tree,    // mv FIRST SECOND, unless SECOND exists
        write_word,   // printf '%s\n' FIRST >SECOND
        prune,        // tzlinks-update prune: what no link names, and a cut stage's leftovers
    } verb;
    std::string first, second;
};
using velm_commands = std::vector<velm_command>;

// Makes the change as a shell command run by root would; false when the
// command would fail (a read-only file system, an immutable directory,
// nothing to move), and nothing changes then.
bool apply(velm_simulation& tree, const velm_command& command);
// The command as a shell line, every path of the device below root ("" for
// the device itself); a link's target is the device's own path.
std::string shell_text(const velm_command& command, const std::string& root);

#endif
