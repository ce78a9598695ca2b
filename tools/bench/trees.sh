# SPDX-License-Identifier: Apache-2.0
# The device trees the benchmark runs on, built below $TREE with the
# builders of tools/sample-tree.sh (source that first). Each is a state a
# device is really found in.

# A device on the update 2024a.1.0 with localtime set.
on_update_2024a() {
    system_dataset 2023c 44l
    update_dataset 2024a.1.0 44l
    put_link /var/db/timezone/tz/2024a.1.0/zoneinfo /var/db/timezone/zoneinfo
    put_link /var/db/timezone/tz/2024a.1.0/icutz /var/db/timezone/icutz
    put_link /var/db/timezone/zoneinfo/Europe/Paris /var/db/timezone/localtime
}

# Every boot but a few: the update in use is also the latest one, so both
# datasets are built and nothing changes.
steady_tree() {
    on_update_2024a
    put_link /var/db/timezone/tz/2024a.1.0 /var/db/timezone/tz_latest
}

# The boot after a download: tz_latest names a newer compatible update.
adopt_tree() {
    on_update_2024a
    update_dataset 2024b.1.0 44l
    put_link /var/db/timezone/tz/2024b.1.0 /var/db/timezone/tz_latest
}

# A zoneinfo link the tool does not understand: back to the system data.
reset_tree() {
    on_update_2024a
    rm "$TREE/var/db/timezone/zoneinfo"
    put_link /usr/share/zoneinfo /var/db/timezone/zoneinfo
}

# A device on its system data, where an update is staged.
staging_tree() {
    system_dataset 2023c 44l
    live_system
}

# The same with the update SRC left below tz/ and named by nothing: what
# prune removes.
superseded_tree() { # SRC
    staging_tree
    cp -a "$1" "$TREE$tz/tz/2025a.1.0"
}
