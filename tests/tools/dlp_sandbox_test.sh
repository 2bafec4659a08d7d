#!/usr/bin/env bash
# dlp-sandbox: the command's status passes through; inside, /data/system/users and /dev are the
# namespace's own; its internal re-entry is refused to anyone else. Usage: dlp_sandbox_test.sh SANDBOX
set -euo pipefail
sandbox=$1 status=0
inside=$("$sandbox" sh -c 'stat -f -c %T /data/system/users /dev; touch /data/system/users/mark; exit 3') || status=$?
[[ $status == 3 && $inside == $'tmpfs\ntmpfs' && ! -e /data/system/users/mark ]] ||
    { echo "FAILED: status $status, inside: $inside" >&2 && exit 1; }
# In a mount namespace of its own, so that a sandbox that obeyed could not touch the machine.
status=0
unshare --mount --propagation private "$sandbox" --in-namespace "" / true 2>/dev/null || status=$?
((status == 2)) || { echo "FAILED: the internal option ran, status $status" >&2 && exit 1; }
