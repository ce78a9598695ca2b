# SPDX-License-Identifier: Apache-2.0
# Sorts the system calls of one traced tzlinks run (strace -f -o FILE) into
# three kinds and names the reason for each call:
#   startup  process start-up, before the tool's first own call (loader,
#            C library initialisation), compared separately with an empty
#            program;
#   needed   a call the tool's behaviour asks for, with what it is for;
#   extra    anything else, with its cause (the target is none).
# A call is "needed" only where it belongs: reads, stats and closes only on
# a descriptor the tool opened for that purpose, fstatat in the ICU
# directory only for a name that has the form of ICU data.
#
# Modes (-v mode=...):
#   (none)   one line per kind: KIND COUNT
#   list     each call after start-up: kind, call, reason
#   extras   the cause of each extra call, one a line
#   purposes one line per purpose: PURPOSE COUNT (needed calls only)
# Portable awk (mawk), as on a fresh Debian machine.

function quoted(text, nth,    i) {
    for (i = 1; i <= nth; i++) {
        if (!match(text, /"[^"]*"/))
            return ""
        if (i == nth)
            return substr(text, RSTART + 1, RLENGTH - 2)
        text = substr(text, RSTART + RLENGTH)
    }
}

function result(text) {
    sub(/.*= /, "", text)
    sub(/ .*/, "", text)
    return text
}

function first_arg(text) {
    sub(/^[a-z0-9_]+\(/, "", text)
    sub(/[,)].*/, "", text)
    return text
}

# purpose: the group a needed call is counted under; reason: the detail.
function note(kind, purpose, reason) {
    count[kind]++
    if (kind == "needed")
        by_purpose[purpose]++
    if (mode == "list")
        printf "%-6s %-60s %s\n", kind, substr(call, 1, 60), reason
    if (mode == "extras" && kind == "extra")
        print reason
}

function extra(cause) { note("extra", "", cause) }

# What a descriptor the tool opens is for, from the path and flags.
function opened_for(path, flags) {
    if ((path == "/var/db/timezone/" || path == "/var/db/timezone/tz/") && flags !~ /O_WRONLY|O_RDWR/)
        return "data protection"
    if ((path ~ /\/\+VERSION$/ || path ~ /\/icutzformat\.txt$/) && flags ~ /O_NONBLOCK/ &&
        flags !~ /O_WRONLY|O_RDWR|O_DIRECTORY/)
        return "first word"
    if (path ~ /\/icutz$/ && flags ~ /O_DIRECTORY/ && flags ~ /O_NONBLOCK/)
        return "ICU directory"
    if (path ~ /\/TZVersionDiffRecord$/ && flags ~ /O_WRONLY/ && flags ~ /O_NOFOLLOW/)
        return "record"
    return ""
}

# The calls each kind of descriptor is opened for; anything else on it is
# extra.
function allowed(what, name) {
    if (what == "data protection")
        return name == "close" || name == "fcntl"
    if (what == "first word")
        return name == "fstat" || name == "read" || name == "close"
    if (what == "ICU directory")
        return name == "getdents64" || name == "fstatat" || name == "close"
    if (what == "record")
        return name == "fstat" || name == "ftruncate" || name == "write" || name == "close"
    return 0
}

function detail(what, name, path) {
    if (what == "data protection")
        return name == "open" ? "data-protection class: open " path : \
            name == "fcntl" ? "data-protection class: set it" : "data-protection class: close"
    if (what == "first word")
        return name == "open" ? "first word of " path ": open" : \
            name == "fstat" ? "first word: fstat (a regular file?)" : "first word: " name
    if (what == "ICU directory")
        return name == "open" ? "ICU directory " path ": open" : \
            name == "getdents64" ? "ICU directory: read names" : \
            name == "fstatat" ? "ICU directory: fstatat the matching name " path : "ICU directory: close"
    if (what == "record")
        return name == "open" ? "version diff record: open (no link followed)" : \
            name == "fstat" ? "version diff record: fstat (a regular file, one name?)" : \
            "version diff record: " name
}

{
    call = $0
    sub(/^[0-9]+ +/, "", call)
    gsub(/  +/, " ", call)
}
call ~ /^\+\+\+|^---|resumed>/ { next }
!started && call ~ /^openat\(AT_FDCWD, "\/var\/db\/timezone\/"/ { started = 1 }
!started {
    count["startup"]++
    next
}
{
    name = call
    sub(/\(.*/, "", name)
    path = quoted(call, 1)
    fd = first_arg(call)
}
# fstat(2) is newfstatat(fd, "", ..., AT_EMPTY_PATH) in glibc 2.33 and later.
name == "newfstatat" && fd != "AT_FDCWD" && path == "" && call ~ /AT_EMPTY_PATH/ { name = "fstat" }
name == "newfstatat" && fd != "AT_FDCWD" && path != "" { name = "fstatat" }
name == "openat" {
    what = opened_for(path, call)
    if (what == "") {
        extra("open of " path " for no known purpose")
        next
    }
    if (result(call) ~ /^[0-9]+$/)
        open_fd[result(call)] = what
    note("needed", what, detail(what, "open", path))
    next
}
name == "close" || name == "read" || name == "fstat" || name == "fstatat" || \
    name == "getdents64" || name == "ftruncate" || name == "fcntl" || (name == "write" && fd != "2") {
    what = open_fd[fd]
    if (what == "") {
        extra(name " on descriptor " fd ", which the tool did not open")
        next
    }
    if (!allowed(what, name)) {
        extra(name " on the " what " descriptor, which does not need it")
        next
    }
    if (name == "fstatat" && path !~ /^icutz[0-9]+[lbe]\.dat$/) {
        extra("fstatat of " path " in the ICU directory, a name that is not ICU data")
        next
    }
    if (name == "close")
        delete open_fd[fd]
    note("needed", what, detail(what, name, path))
    next
}
name == "write" { note("needed", "warnings", "warning on standard error (warn(3): name, message, error text)"); next }
name == "access" && path == "/var/db/icutz" {
    note("needed", "links", "legacy ICU link: does /var/db/icutz resolve?")
    next
}
name == "access" && path == "/var/db/timezone/icutz" {
    note("needed", "links", "legacy ICU link: does the new one resolve?")
    next
}
name == "access" { note("needed", "links", "does " path " resolve?"); next }
(name == "unlink" || name == "rmdir") && path == "/var/db/icu" {
    note("needed", "links", "remove(3) of the old /var/db/icu")
    next
}
name == "unlink" { note("needed", "links", "remove " path); next }
name == "readlink" { note("needed", "links", "read link " path); next }
name == "symlink" { note("needed", "links", "create link " quoted(call, 2)); next }
name == "exit_group" { note("needed", "exit", "exit"); next }
name == "futex" {
    extra("futex: a pthread_once ends and wakes waiters (one-time set-up in a shared library, such as libgcc_s's unwinder on the first throw)")
    next
}
name == "brk" || name == "mmap" || name == "munmap" { extra(name ": malloc grows or trims the heap"); next }
{ extra(name ": unexplained") }

END {
    if (mode == "")
        printf "startup %d\nneeded %d\nextra %d\n", count["startup"], count["needed"], count["extra"]
    if (mode == "purposes")
        for (p in by_purpose)
            printf "%s\t%d\n", p, by_purpose[p]
}
