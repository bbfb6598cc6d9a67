#!/bin/bash
# The inner half of "./dev fresh", with mounts and processes of its own: fresh_inside.sh ROOT FOLDER PACKAGES COMMAND...
set -euo pipefail

root=$1
folder=$2
packages=$3
shift 3

mount -t proc proc "$root/proc"
mount --rbind /dev "$root/dev"
mount --bind "$packages" "$root/var/cache/apt/archives"

# Nothing of this machine's environment but what leads to the network, and what says how to show things.
kept=(PATH=/usr/sbin:/usr/bin:/sbin:/bin HOME=/root TERM="${TERM:-dumb}")
for name in http_proxy https_proxy ftp_proxy no_proxy HTTP_PROXY HTTPS_PROXY FTP_PROXY NO_PROXY CI VORN_JOBS; do
    if [[ -v $name ]]; then
        kept+=("$name=${!name}")
    fi
done

# shellcheck disable=SC2016 # expanded inside
exec chroot "$root" /usr/bin/env -i "${kept[@]}" /bin/bash -c 'update-ca-certificates >/dev/null 2>&1; cd "$1" && shift && exec "$@"' fresh "$folder" "$@"
