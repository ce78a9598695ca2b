# Builders for sample device trees, sourced by the demo, the benchmark, the
# fault runs and the end-to-end tests. Every path is taken below $TREE
# (empty: the real fixed paths, as inside the sandbox).
: "${TREE:=}"
#
#   system_dataset 2023c 44l       tz database 2023c and ICU schema 44l on
#                                  the system partition
#   update_dataset 2024a.1.0 44l   an unpacked update below /var/db/timezone/tz
#   put_link TARGET PATH           a symbolic link, parents created
#   put_file PATH TEXT             a file holding TEXT, parents created

put_file() {
    mkdir -p "$TREE$(dirname "$1")"
    printf '%s' "$2" >"$TREE$1"
}

put_link() {
    mkdir -p "$TREE$(dirname "$2")"
    ln -s "$1" "$TREE$2"
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

update_dataset() {
    local root=/var/db/timezone/tz/$1
    put_file "$root/zoneinfo/+VERSION" "${1%%.*}
"
    put_zones "$root/zoneinfo"
    put_file "$root/icutz/icutz$2.dat" "icu-data"
}
