# Sorts the system calls of one traced tzlinks run (strace -f -o FILE) into
# three kinds and names the reason for each call:
#   startup  process start-up, before the tool's first own call (loader,
#            C library initialisation), compared separately with an empty
#            program;
#   needed   a call the tool's behaviour asks for;
#   extra    anything else, with its cause.
# With -v mode=list it prints each call after start-up with its kind and
# reason; with -v mode=extras the reason of each extra call; otherwise one
# line per kind: KIND COUNT.
# Portable awk (mawk), as on a fresh Debian machine.

function quoted(text,    start) {
    if (!match(text, /"[^"]*"/))
        return ""
    return substr(text, RSTART + 1, RLENGTH - 2)
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

function note(kind, reason) {
    count[kind]++
    if (mode == "list")
        printf "%-7s %-58s %s\n", kind, substr(call, 1, 58), reason
    if (mode == "extras" && kind == "extra")
        print reason
}

# Reason for a file opened by the tool, from its path.
function file_reason(path) {
    if (path == "/var/db/timezone/" || path == "/var/db/timezone/tz/")
        return "data-protection class: open and close the directory"
    if (path ~ /\+VERSION$/)
        return "read the tz version (+VERSION)"
    if (path ~ /icutzformat\.txt$/)
        return "read the system ICU schema (icutzformat.txt)"
    if (path ~ /TZVersionDiffRecord$/)
        return "write the version diff record"
    if (path == "." || path ~ /\/icutz$/)
        return "ICU directory walk (fts)"
    return ""
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
    path = quoted(call)
}
name == "openat" {
    reason = file_reason(path)
    if (reason == "") {
        note("extra", "UNEXPLAINED open")
        next
    }
    fd[result(call)] = reason
    note("needed", reason)
    next
}
name == "close" || name == "read" || name == "fchdir" || name == "getdents64" || \
    (name == "write" && first_arg(call) != "2") || \
    (name == "newfstatat" && first_arg(call) != "AT_FDCWD") {
    reason = fd[first_arg(call)]
    if (reason == "") {
        note("extra", "UNEXPLAINED call on an unknown descriptor")
        next
    }
    note("needed", reason)
    next
}
name == "newfstatat" && path ~ /\/icutz$/ { note("needed", "ICU directory walk (fts): the root"); next }
name == "newfstatat" && call ~ /AT_SYMLINK_NOFOLLOW/ { note("needed", "ICU directory walk (fts): one entry"); next }
name == "write" { note("needed", "warning on standard error (warn(3))"); next }
name == "access" && path == "/var/db/icutz" { note("needed", "legacy ICU link migration: old link there?"); next }
name == "access" && path == "/var/db/timezone/icutz" { note("needed", "legacy ICU link migration: new link there?"); next }
name == "access" { note("needed", "existence test of " path); next }
(name == "unlink" || name == "rmdir") && path == "/var/db/icu" { note("needed", "remove(3) of /var/db/icu"); next }
name == "unlink" { note("needed", "remove link " path); next }
name == "readlink" { note("needed", "read link " path); next }
name == "symlink" { note("needed", "create link " path); next }
name == "exit_group" { note("needed", "exit"); next }
name == "futex" { note("extra", "libstdc++ locale initialisation (pthread_once wakes waiters)"); next }
name == "brk" || name == "mmap" || name == "munmap" {
    note("extra", "malloc: heap grows for the walk's directory buffer, then trims")
    next
}
{ note("extra", "UNEXPLAINED") }

END {
    if (mode == "")
        printf "startup %d\nneeded %d\nextra %d\n", count["startup"], count["needed"], count["extra"]
}
