#!/bin/bash
# Runs a command whose mounts reach nobody else, in a namespace that was made with mounts as they were:
# unshare --mount --propagation unchanged own_mounts.sh COMMAND... In a chroot "/" is no mount that could be made private;
# there, what is mounted below must be private already.
set -euo pipefail

if ! mount --make-rprivate / 2>/dev/null && grep -q ' shared:' /proc/self/mountinfo; then
    printf 'mounts in this chroot are shared with the machine\n' >&2
    exit 1
fi
exec "$@"
