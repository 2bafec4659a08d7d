#!/usr/bin/env bash
# One scene per verb of dlpctl, inside dlp-sandbox with TZ=UTC. Usage: dlpctl_test.sh DLPCTL SCRATCH_PARENT
set -euo pipefail
dlpctl=$1 failures=0 scratch=$(mktemp -d "$2/dlpctl-test-XXXXXX")
trap 'rm -rf "$scratch"' EXIT
cd "$scratch" # relative paths: the library takes the extension from the whole path
frozen=(faketime -f "2001-09-09 01:46:40") # 1000000000

fail() { echo "FAILED $*" >&2 && failures=$((failures + 1)); }
check() { # SCENE STATUS STDOUT STDERR_GLOB COMMAND...: the status, the whole stdout, the whole stderr
    local scene=$1 status=$2 stdout=$3 stderr_glob=$4 actual_status=0 actual && shift 4
    actual=$("$@" 2>"$scratch/stderr") || actual_status=$?
    [[ $actual_status == "$status" && $actual == "$stdout" && $(<"$scratch/stderr") == $stderr_glob ]] ||
        fail "$scene: status $actual_status, stdout:"$'\n'"$actual"$'\n'"stderr:"$'\n'"$(<"$scratch/stderr")"
}

touch none future past now zero bad report
for stamp in future:1000003600 past:999996400 now:1000000000 zero:0; do "$dlpctl" stamp "${stamp%:*}" "${stamp#*:}" >/dev/null; done
setfattr -n user.zorvat_dlp -v 0x0102030405060708 bad
check show 1 "none: no expiry
future: 1000003600 (2001-09-09 02:46:40 UTC, in 1h 0m 0s)
past: 999996400 (2001-09-09 00:46:40 UTC, expired 1h 0m 0s ago)
now: 1000000000 (2001-09-09 01:46:40 UTC, expired 0s ago)
zero: no expiry (stored 0)" "dlpctl: missing: No such file or directory
dlpctl: bad: bad expiry value (8 bytes)" "${frozen[@]}" "$dlpctl" show none future past missing now zero bad
log_line="log: main/E DLP_LIBDLP :   in get_dlp_file_expiry_time normal file (none)"
check "show --log" 0 $'none: no expiry\nnone: no expiry' "$log_line"$'\n'"$log_line" "$dlpctl" --log show none none

check "stamp" 0 "report: 1000003600 (2001-09-09 02:46:40 UTC, in 1h 0m 0s)" "" "${frozen[@]}" "$dlpctl" stamp report 1000003600
getfattr -e hex -n user.zorvat_dlp report | grep -qx 'user.zorvat_dlp=0x10d89a3b000000000000000000000000' || fail "stamp's bytes"
check "stamp +1d" 0 "report: 1000086400 (2001-09-10 01:46:40 UTC, in 1d 0h 0m 0s)" "" "${frozen[@]}" "$dlpctl" stamp report +1d
check "stamp missing" 1 "" "dlpctl: missing: No such file or directory" "$dlpctl" stamp missing 5

check "cmd 6" 0 "0" "" "$dlpctl" cmd 6 100 1
check "cmd 3" 0 "0" "" "$dlpctl" cmd 3 150 86400
[[ $(sqlite3 /data/system/users/dlp/dlpinfo.db 'SELECT Id, Time FROM dlpInfo') == "150|86400" ]] || fail "cmd 3's rows"

# Container 150 keeps new files for a day (cmd 3 above).
replay_without_pids() { "$dlpctl" replay - | sed -E 's/-> pid [0-9]+$/-> pid REAL/'; }
check replay 1 "1: clock 1000000000 -> 1000000000
2: process 7 com.hancom.office.viewer -> pid REAL
3: process 8 \"org.example.browser\" -> pid REAL
4: file Report.docx +1h -> 1000003600 (2001-09-09 02:46:40 UTC, in 1h 0m 0s)
5: 4 0 7 Report.docx -> 0
6: 4 0 8 Report.docx -> 0
7: clock +599 -> 1000000599
8: file \"new dir/Draft.doc\" -> created
9: create 7 \"new dir/Draft.doc\" 150 -> 0
10: file Copy.doc -> created
11: create 8 Copy.doc 150 -> 0
12: show \"new dir/Draft.doc\" -> 1000003600 (2001-09-09 02:46:40 UTC, in 50m 1s)
13: show Copy.doc -> 1000086999 (2001-09-10 01:56:39 UTC, in 1d 0h 0m 0s)" \
    "dlpctl: -:13: expected '1000003600', got '1000086999 (2001-09-10 01:56:39 UTC, in 1d 0h 0m 0s)'" \
    replay_without_pids <<'EOF'
clock 1000000000
process 7 com.hancom.office.viewer
process 8   "org.example.browser"  # another app
file Report.docx +1h
4 0 7 Report.docx
4 0 8 Report.docx
clock +599 => 1000000599 # the last second in which the office suite inherits
file "new dir/Draft.doc"
create 7 "new dir/Draft.doc" 150
file Copy.doc
create 8 Copy.doc 150
show "new dir/Draft.doc" => 1000003600
show Copy.doc => 1000003600
EOF

while IFS='|' read -r status arguments stdin stderr; do
    read -ra words <<<"$arguments"
    stdin=${stdin//\\n/$'\n'}
    check "${arguments:-no verb} <<<'$stdin'" "$status" "${stdin:+1: clock 5 -> 5}" "$stderr" "$dlpctl" "${words[@]}" <<<"$stdin"
done <<'EOF'
2|replay -|clock 5\ncreate 7 a.doc x\nclock 6|dlpctl: -:2: bad number 'x'
2|replay -|clock 5\nshow "a.doc\nclock 6|dlpctl: -:2: unterminated quote
2|||usage: dlpctl*
2|frob||dlpctl: unknown verb frob*
2|--bogus show none||dlpctl: unknown option --bogus*
2|stamp report +1y||dlpctl: stamp: bad expiry '+1y'*
EOF
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
