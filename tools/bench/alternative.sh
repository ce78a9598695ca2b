#!/bin/sh
# SPDX-License-Identifier: Apache-2.0
# The usual alternative to tzlinks, for comparison only: the same boot-time
# decision written as a plain POSIX shell script with readlink, ln and
# sort -V. It keeps the dataset the zoneinfo link names when it fits the
# system partition, falls back to the system data otherwise, adopts the
# update named by tz_latest when its ICU schema matches and its version is
# newer, and checks the localtime link.
set -u
db=/var/db/timezone
system_zoneinfo=/usr/share/zoneinfo.default

read -r system_version _ <"$system_zoneinfo/+VERSION" || true
system_version=${system_version:-}.1.0
read -r system_schema _ </usr/share/icu/icutzformat.txt || true

# ICU schema of an update, from the name of its icutz<schema>.dat file.
schema_of() {
    for f in "$1"/icutz/icutz*.dat; do
        s=${f##*/icutz}
        s=${s%.dat}
        case $s in '' | *[!0-9lbe]*) continue ;; esac
        echo "$s"
        return
    done
}

# True when version $1 sorts strictly after version $2.
newer() {
    [ "$1" != "$2" ] && [ "$(printf '%s\n%s\n' "$1" "$2" | sort -V | tail -n 1)" = "$1" ]
}

use_system() {
    rm -f "$db/zoneinfo" "$db/icutz"
    ln -s "$system_zoneinfo" "$db/zoneinfo"
}

latest=$(readlink "$db/tz_latest")
current=$(readlink "$db/zoneinfo")
case $current in
"$db"/tz/*/zoneinfo) root=${current%/zoneinfo} version=${root#"$db"/tz/} ;;
"$system_zoneinfo") root='' version=$system_version ;;
*)
    echo "invalid zoneinfo link; resetting to system partition" >&2
    use_system
    root='' version=$system_version
    ;;
esac
in_use=$version
if [ -n "$root" ]; then
    if [ "$(schema_of "$root")" != "$system_schema" ] || newer "$system_version" "$version"; then
        echo "zoneinfo link points at incompatible data; resetting" >&2
        use_system
        in_use=$system_version
    fi
fi

if [ -n "$latest" ]; then
    latest_version=${latest#"$db"/tz/}
    if [ "$(schema_of "$latest")" = "$system_schema" ] && newer "$latest_version" "$version"; then
        rm -f "$db/zoneinfo" "$db/icutz"
        ln -s "$latest/zoneinfo" "$db/zoneinfo"
        ln -s "$latest/icutz" "$db/icutz"
        printf '%s_%s' "$in_use" "$latest_version" >"$db/TZVersionDiffRecord"
    else
        echo "update not compatible or older: $latest_version vs. $version" >&2
    fi
fi

localtime=$(readlink "$db/localtime")
case $localtime in
"$db"/zoneinfo*) ;;
/usr/share/zoneinfo*)
    rm -f "$db/localtime"
    ln -s "$db/zoneinfo${localtime#/usr/share/zoneinfo}" "$db/localtime"
    ;;
*)
    rm -f "$db/localtime"
    ln -s "$db/zoneinfo/America/Los_Angeles" "$db/localtime"
    ;;
esac
exit 0
