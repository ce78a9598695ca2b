#!/usr/bin/env bash
# Checks the manuals with mandoc's linter at warning level, so that only real
# mistakes count and not style notices about the host's manual index.
# Exits 77 (reported as skipped) where mandoc is not installed.
#
# Usage: tests/manual_lint.sh MANUAL...
set -euo pipefail
[ $# -ge 1 ] || { echo "usage: $0 MANUAL..." >&2; exit 64; }
command -v mandoc >/dev/null || { echo "mandoc is not installed" >&2; exit 77; }

status=0
messages=$(mandoc -Tlint -W warning "$@" 2>&1) || status=$?
if [ "$status" -ne 0 ] || [ -n "$messages" ]; then
    printf '%s\n' "$messages" >&2
    echo "mandoc -Tlint found problems in $* (status $status)" >&2
    exit 1
fi
echo "$*: mandoc -Tlint clean"
