#!/usr/bin/env bash
# Configures a fresh build of the sources, installs it with DESTDIR into a
# staging root and checks that exactly the program and its manual land
# there: test scaffolding such as GoogleTest must never reach a device.
# Everything is written below one temporary directory, removed on exit.
#
# Usage: tests/install_check.sh SOURCE_DIR [CMAKE_CONFIGURE_ARG ...]
set -euo pipefail
[ $# -ge 1 ] || { echo "usage: $0 SOURCE_DIR [CMAKE_ARG ...]" >&2; exit 64; }
source_dir=$1
shift

work=$(mktemp -d)
trap 'rm -rf "$work"' EXIT

cmake -S "$source_dir" -B "$work/build" -DCMAKE_BUILD_TYPE=Release "$@" >"$work/configure.log" ||
    { cat "$work/configure.log"; exit 1; }
cmake --build "$work/build" --target tzlinks -j 2 >"$work/build.log" ||
    { cat "$work/build.log"; exit 1; }
DESTDIR="$work/stage" cmake --install "$work/build" --prefix /usr >"$work/install.log" ||
    { cat "$work/install.log"; exit 1; }

expected='usr/sbin/tzlinks
usr/share/man/man8/tzlinks.8'
staged=$(cd "$work/stage" && find . -type f -o -type l | sed 's|^\./||' | LC_ALL=C sort)
if [ "$staged" != "$expected" ]; then
    printf 'staged files differ from the expected ones:\n' >&2
    diff <(printf '%s\n' "$expected") <(printf '%s\n' "$staged") >&2 || true
    exit 1
fi
[ -x "$work/stage/usr/sbin/tzlinks" ] || { echo "usr/sbin/tzlinks is not executable" >&2; exit 1; }
cmp -s "$source_dir/docs/tzlinks.8" "$work/stage/usr/share/man/man8/tzlinks.8" ||
    { echo "the installed manual differs from docs/tzlinks.8" >&2; exit 1; }
echo "staged: $(echo "$staged" | tr '\n' ' ')"
