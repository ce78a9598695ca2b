# SPDX-License-Identifier: Apache-2.0
# Builders for sample device trees, sourced by the demo, the benchmark, the
# fault runs and the end-to-end tests. Every path is taken below $TREE
# (empty: the real fixed paths, as inside the sandbox).
#
#   system_dataset 2023c 44l       tz database 2023c and ICU schema 44l on
#                                  the system partition
#   update_dataset 2024a.1.0 44l   an unpacked update below /var/db/timezone/tz
#   update_source DIR 2024a 44l    the same, to be staged, in DIR
#   put_link TARGET PATH           a symbolic link, parents created
#   put_file PATH TEXT             a file holding TEXT (printf %b escapes:
#                                  \n, \t, \0NNN), parents created
#   relink NAME TARGET             /var/db/timezone/NAME, whatever it was,
#                                  replaced by a link to TARGET
#   repeat N C                     prints the character C N times
: "${TREE:=}"

put_file() {
    mkdir -p "$TREE$(dirname "$1")"
    printf '%b' "$2" >"$TREE$1"
}

put_link() {
    mkdir -p "$TREE$(dirname "$2")"
    ln -s "$1" "$TREE$2"
}

relink() {
    rm -rf "$TREE/var/db/timezone/$1"
    put_link "$2" "/var/db/timezone/$1"
}

repeat() {
    head -c "$1" /dev/zero | tr '\0' "$2"
}

# A few zone files, so that localtime links have something to point at.
put_zones() {
    put_file "$1/America/Los_Angeles" "TZif-LA"
    put_file "$1/Europe/Paris" "TZif-Paris"
}

system_dataset() {
    put_file /usr/share/zoneinfo.default/+VERSION "$1
"
    put_zones /usr/share/zoneinfo.default
    put_file /usr/share/icu/icutzformat.txt "$2
"
    mkdir -p "$TREE/var/db/timezone/tz"
}

# update_source DIR RELEASE SCHEMA: an update as it is unpacked into DIR.
update_source() {
    put_file "$1/zoneinfo/+VERSION" "$2
"
    put_zones "$1/zoneinfo"
    # What ICU's data files begin with: a header size, then 0xda 0x27.
    put_file "$1/icutz/icutz$3.dat" '\0040\0000\0332\0047icu-data'
}

update_dataset() {
    update_source "/var/db/timezone/tz/$1" "${1%%.*}" "$2"
}

# Shortcuts for whole device states (links of the live dataset and a
# localtime link to Europe/Paris; the system dataset must exist).
tz=/var/db/timezone

live_system() {
    put_link /usr/share/zoneinfo.default $tz/zoneinfo
    put_link $tz/zoneinfo/Europe/Paris $tz/localtime
}

# live_update NAME [SCHEMA]: the update NAME exists and is live.
live_update() {
    update_dataset "$1" "${2:-44l}"
    put_link $tz/tz/$1/zoneinfo $tz/zoneinfo
    put_link $tz/tz/$1/icutz $tz/icutz
    put_link $tz/zoneinfo/Europe/Paris $tz/localtime
}

# latest NAME: tz_latest names the update NAME (which need not exist).
latest() {
    put_link $tz/tz/$1 $tz/tz_latest
}

# /etc/localtime as an image has it: through the boot's localtime link.
etc_localtime() {
    mkdir -p "$TREE/etc"
    ln -sfn $tz/localtime "$TREE/etc/localtime"
}

# The demo's device, as an image leaves it before its first boot: system
# data 2023c live, an update 2024a.1.0 named by tz_latest, and the links of
# an older system (localtime into /usr/share/zoneinfo, /var/db/icutz).
demo_device() {
    system_dataset 2023c 44l
    update_dataset 2024a.1.0 44l
    put_link /usr/share/zoneinfo.default $tz/zoneinfo
    latest 2024a.1.0
    put_link /usr/share/zoneinfo/Europe/Paris $tz/localtime
    put_link /usr/share/icu /var/db/icutz
    etc_localtime
}

# real_update_source DIR RELEASE: an update made of real parts: zone files
# compiled by zic from a small source (Europe/Paris abbreviated XPT, so
# that a reader shows whose data it read), and ICU's own time-zone data,
# taken from this machine's ICU library with icupkg, its version set to
# RELEASE with derb and genrb, packed as icutz44l.dat beside its .res files
# (ICU's readers load those through ICU_TIMEZONE_FILES_DIR).
real_update_source() {
    local dir=$TREE$1 release=$2 work lib package
    work=$(mktemp -d)
    mkdir -p "$dir/zoneinfo" "$dir/icutz" "$work/res"
    printf 'Zone Europe/Paris 1:00 - XPT\nZone America/Los_Angeles -8:00 - XLT\n' >"$work/zones"
    zic -d "$dir/zoneinfo" "$work/zones"
    printf '%s\n' "$release" >"$dir/zoneinfo/+VERSION"
    # The library's data is one ICU data package in its read-only data:
    # symbol address, size and name, section address and file offset.
    lib=$(ls /usr/lib/*-linux-gnu/libicudata.so.[0-9]* | head -n 1)
    set -- $(nm -D -S "$lib" | awk '/ icudt[0-9]+_dat$/ { print $1, $2, $4 }') \
        $(readelf -SW "$lib" | awk '{ for (i = 1; i < NF; i++) if ($i == ".rodata") print $(i + 2), $(i + 3) }')
    package=${3%_dat}l.dat # the name its items are filed under
    tail -c +$((0x$1 - 0x$4 + 0x$5 + 1)) "$lib" | head -c $((0x$2)) >"$work/$package"
    printf '%s\n' zoneinfo64.res metaZones.res timezoneTypes.res windowsZones.res >"$work/list.txt"
    (cd "$work" && icupkg -d res -x list.txt "$package")
    (cd "$work/res" && derb -c ./zoneinfo64.res 2>/dev/null) |
        sed -e "s/^zoneinfo64{/zoneinfo64:table(nofallback){/" \
            -e "s/TZVersion { \"[^\"]*\" }/TZVersion { \"$release\" }/" >"$work/zoneinfo64.txt"
    genrb -q -d "$work/res" "$work/zoneinfo64.txt"
    (cd "$work" && icupkg -tl -s res -a list.txt new "$dir/icutz/icutz44l.dat")
    cp "$work"/res/*.res "$dir/icutz/"
    rm -rf "$work"
}
