#!/usr/bin/env bash
# One scene per verb of dlpctl, inside dlp-sandbox with TZ=UTC; the trace language's lines are
# the decision scenarios' business. Usage: dlpctl_test.sh DLPCTL SCRATCH_PARENT
set -euo pipefail
dlpctl=$1 failures=0 scratch=$(mktemp -d "$2/dlpctl-test-XXXXXX")
trap 'rm -rf "$scratch"' EXIT
cd "$scratch" # relative paths: the library takes the extension from the whole path
# libfaketime without its wrapper, whose shared semaphore 32-bit programs read with another layout.
at() { LD_PRELOAD='/usr/$LIB/faketime/libfaketime.so.1' FAKETIME=$1 "${@:2}"; }
frozen=(at "2001-09-09 01:46:40") # 1000000000

fail() { echo "FAILED $*" >&2 && failures=$((failures + 1)); }
check() { # SCENE STATUS STDOUT STDERR_GLOB COMMAND...: the status, the whole stdout, the whole stderr
    local scene=$1 status=$2 stdout=$3 stderr_glob=$4 actual_status=0 actual && shift 4
    actual=$("$@" 2>"$scratch/stderr") || actual_status=$?
    [[ $actual_status == "$status" && $actual == "$stdout" && $(<"$scratch/stderr") == $stderr_glob ]] ||
        fail "$scene: status $actual_status, stdout:"$'\n'"$actual"$'\n'"stderr:"$'\n'"$(<"$scratch/stderr")"
}

touch none report zero bad
"$dlpctl" stamp zero 0 >/dev/null
setfattr -n user.zorvat_dlp -v 0x0102030405060708 bad
check stamp 0 "report: 1000003600 (2001-09-09 02:46:40 UTC, in 1h 0m 0s)" "" "${frozen[@]}" "$dlpctl" stamp report +1h
getfattr -e hex -n user.zorvat_dlp report | grep -qx 'user.zorvat_dlp=0x10d89a3b000000000000000000000000' || fail "stamp's bytes"
check "stamp missing" 1 "" "dlpctl: missing: No such file or directory" "$dlpctl" stamp missing 5
check show 1 "none: no expiry
report: 1000003600 (2001-09-09 02:46:40 UTC, expired 23h 0m 0s ago)
zero: no expiry (stored 0)" "dlpctl: missing: No such file or directory
dlpctl: bad: bad expiry value (8 bytes)" at "2001-09-10 01:46:40" "$dlpctl" show none report missing zero bad
check "show --log" 0 "none: no expiry" "log: main/E DLP_LIBDLP :   in get_dlp_file_expiry_time normal file (none)" \
    "$dlpctl" --log show none

check "cmd 3" 0 "0" "" "$dlpctl" cmd 3 150 86400
[[ $(sqlite3 /data/system/users/dlp/dlpinfo.db 'SELECT Id, Time FROM dlpInfo') == "150|86400" ]] || fail "cmd 3's rows"
check "replay" 1 $'1: clock 5 -> 5\n2: show none -> no expiry' "dlpctl: -:2: expected 'none', got 'no expiry'" \
    "$dlpctl" replay - <<<$'clock 5 => 5\nshow none => none # a wrong expectation'

while IFS='|' read -r status arguments stdin stderr; do
    read -ra words <<<"$arguments"
    check "${arguments:-no verb} <<<'$stdin'" "$status" "" "$stderr" "$dlpctl" "${words[@]}" <<<"${stdin//\\n/$'\n'}"
done <<'CASES'
2|replay -|create 7 a.doc x|dlpctl: -:1: bad number 'x'
2|replay -|show "a.doc|dlpctl: -:1: unterminated quote
2|replay -|file first.doc\nshow /etc/hostname|dlpctl: -:2: path '/etc/hostname' lies outside the working directory and /data
2|replay -|file first.doc\n4 0 7 docs/../first.doc|dlpctl: -:2: path 'docs/../first.doc' has a '..' component
2|||usage: dlpctl*
2|--bogus show none||dlpctl: unknown option --bogus*
2|stamp report +1y||dlpctl: stamp: bad expiry '+1y'*
CASES
ln -s target.doc link.doc # a trace writes through no link, and a refused one writes nothing
check "file, a link" 1 "1: file link.doc -> error: cannot create link.doc: Too many levels of symbolic links" \
    "dlpctl: -:1: cannot create link.doc: Too many levels of symbolic links" "$dlpctl" replay - <<<"file link.doc"
[[ ! -e target.doc && ! -e first.doc ]] || fail "a trace wrote target.doc or first.doc"
for verb in show stamp cmd replay demo; do [[ $("$dlpctl" $verb --help) == "usage: dlpctl"* ]] || fail "$verb --help"; done

# Outside the sandbox, that is where /data/system/users is no tmpfs, the database verbs refuse.
for verb in "cmd 6 100 1" "replay -"; do
    check "refused: $verb" 2 "" "*run it inside dlp-sandbox*" unshare --mount --propagation private sh -c \
        'mount --bind "$0" /data/system/users && exec "$@"' "$scratch" "$dlpctl" $verb </dev/null
done

demos_before=$(find /tmp -maxdepth 1 -name 'dlpctl-demo-*' | wc -l)
demo=$("$dlpctl" demo) || fail "demo exited with $?"
read -r report draft copy backup <<<"$(sed -n 's/^[0-9]*: show [A-Za-z]*\.[a-z]* -> \([0-9]*\) .*/\1/p' <<<"$demo" | paste -sd ' ')"
# Inherited; a day after a second that may have ticked since the report's; the end of the day.
((draft == report && copy - report >= 82800 && copy - report <= 82801 && backup == $(date -d 23:59:59 +%s))) ||
    fail "demo:"$'\n'"$demo"
[[ $(find /tmp -maxdepth 1 -name 'dlpctl-demo-*' | wc -l) == "$demos_before" ]] || fail "demo left its directory"
exit $((failures > 0))
