#!/usr/bin/env bash
# Installs a fresh release build of the sources (linked as shipped, stripped)
# into a staging root, checks that exactly the package's files land there, so
# that no test scaffolding ever reaches a device, that systemd-analyze
# accepts the installed boot unit, and that mandoc's linter finds no mistake
# (warning level: not mere style notices) in the manuals. All below one
# temporary directory.
#
# Usage: tests/install_check.sh SOURCE_DIR [CMAKE_CONFIGURE_ARG ...]
set -euo pipefail
[ $# -ge 1 ] || { echo "usage: $0 SOURCE_DIR [CMAKE_ARG ...]" >&2; exit 64; }
src=$1
shift
work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT
quiet() { "$@" >"$work/log" 2>&1 || { cat "$work/log" >&2; exit 1; }; }

quiet cmake -S "$src" -B "$work/build" -DCMAKE_BUILD_TYPE=Release -DTZLINKS_TESTS=OFF "$@"
quiet cmake --build "$work/build" -j 2
DESTDIR=$work/stage quiet cmake --install "$work/build" --prefix /usr --strip
staged=$(cd "$work/stage" && find . ! -type d | LC_ALL=C sort)
diff - <(echo "$staged") >&2 <<'END' || { echo "staged files differ (<expected >staged)" >&2; exit 1; }
./lib/systemd/system/tzlinks.service
./usr/sbin/tzlinks
./usr/sbin/tzlinks-status
./usr/share/doc/tzlinks/changelog.gz
./usr/share/doc/tzlinks/copyright
./usr/share/lintian/overrides/tzlinks
./usr/share/man/man8/tzlinks-status.8.gz
./usr/share/man/man8/tzlinks.8.gz
END
# With --root, verify finds ExecStart's program in the staging root, and
# through MANPATH the manual that Documentation= names. It only warns of
# some mistakes, so any message fails.
MANPATH=$work/stage/usr/share/man quiet systemd-analyze verify --root="$work/stage" \
    "$work/stage/lib/systemd/system/tzlinks.service"
[ ! -s "$work/log" ] || { cat "$work/log" >&2; exit 1; }
quiet mandoc -Tlint -W warning "$src"/docs/*.8
[ ! -s "$work/log" ] || { cat "$work/log" >&2; exit 1; }
echo "staged as expected; systemd-analyze verify and mandoc -Tlint: clean"
