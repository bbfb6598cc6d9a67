#!/bin/bash
# The first process of a host, in fresh namespaces: init.sh FOLDER NAME KIND [SHARE...].
# Makes the host's own view of the machine's files, says so in FOLDER/ready, and then only reaps what ends.
set -uo pipefail

folder=$1
name=$2
kind=$3
shift 3
root=$folder/space/root

fail() {
    printf '%s\n' "$*" >&2
    exit 1
}

must() {
    "$@" || fail "\"$*\" failed"
}

# Of this shell as the machine sees it: /proc is still the machine's.
remember_init() {
    local line fields
    read -r line </proc/self/stat
    read -ra fields <<<"${line##*) }"
    printf '%s %s\n' "${line%% *}" "${fields[19]}" >"$folder/init" || fail "$folder is gone"
}

# Copy on write: reads come from the machine, writes go to memory and end with the host.
overlay() {
    local below=$1 at=$2 layer=$folder/space/layers$1
    mkdir -p -- "$layer/upper" "$layer/work"
    # The top of the view has the owner and mode of what it covers.
    chmod --reference="$below" -- "$layer/upper"
    mount -t overlay -o "lowerdir=$below,upperdir=$layer/upper,workdir=$layer/work" overlay "$at"
}

# Other disks that are mounted into the machine's tree, such as /usr or /var, are not part of the view of "/".
overlay_other_disks() {
    local line point type
    for line in "${disks[@]}"; do
        point=$(cut -d ' ' -f 5 <<<"$line")
        type=${line#* - }
        type=${type%% *}
        [[ $point =~ ^/(usr|var|etc|opt|home|root|srv|lib[0-9a-z]*|bin|sbin)(/|$) && -d $point ]] || continue
        case $type in
            ext[234] | xfs | btrfs | f2fs | zfs | overlay | erofs | squashfs | bcachefs) ;;
            *) continue ;;
        esac
        { [[ $point != *[,:\\]* ]] && mkdir -p -- "$root$point" && overlay "$point" "$root$point"; } ||
            fail "no copy-on-write view of $point ($type) could be mounted"
    done
}

make_devices() {
    local device
    must mount -t tmpfs -o mode=755,nosuid vorn-lab "$root/dev"
    mkdir "$root/dev/pts" "$root/dev/shm"
    for device in null zero full random urandom tty; do
        : >"$root/dev/$device"
        must mount --bind "/dev/$device" "$root/dev/$device"
    done
    must mount -t devpts -o newinstance,ptmxmode=0666,mode=0620,gid=5 devpts "$root/dev/pts"
    must mount -t tmpfs -o mode=1777,nosuid,nodev vorn-lab "$root/dev/shm"
    ln -s pts/ptmx "$root/dev/ptmx"
    ln -s /proc/self/fd "$root/dev/fd"
    ln -s /proc/self/fd/0 "$root/dev/stdin"
    ln -s /proc/self/fd/1 "$root/dev/stdout"
    ln -s /proc/self/fd/2 "$root/dev/stderr"
}

fresh_folder() {
    rm -rf -- "${root:?}$1"
    mkdir -p -- "$root$1"
    chmod "$2" -- "$root$1"
}

# What belongs to the machine and not to a host: its logs, jobs, domains and keys.
make_fresh() {
    local path
    must mount -t tmpfs -o mode=755,nosuid vorn-lab "$root/run"
    must mount -t tmpfs -o mode=1777,nosuid vorn-lab "$root/tmp"
    mkdir -m 755 "$root/run/samba"
    mkdir -m 1777 "$root/run/lock"
    fresh_folder /var/tmp 1777
    for path in /var/log /var/log/samba /var/lib/samba /var/cache/samba /etc/samba /etc/cron.d /var/spool/cron; do
        fresh_folder "$path" 755
    done
    fresh_folder /var/lib/samba/private 700
    fresh_folder /var/spool/cron/crontabs 1730
    chgrp crontab "$root/var/spool/cron/crontabs" 2>/dev/null || true
    rm -rf -- "$root"/{etc/crontab,etc/krb5.keytab,etc/krb5.conf,etc/vorninfo.conf,usr/vorn,var/lib/vorn}
    rm -f -- "$root"/etc/{resolv.conf,hosts,hostname} "$root"/usr/sbin/policy-rc.d
    touch "$root/etc/resolv.conf"
    printf '[global]\n' >"$root/etc/samba/smb.conf"
    printf '%s\n' "$name" >"$root/etc/hostname"
    printf '127.0.0.1 localhost\n%s %s\n' "$(<"$folder/address")" "$name" >"$root/etc/hosts"
    printf '[libdefaults]\n\tdns_lookup_realm = false\n\tdns_lookup_kdc = true\n\trdns = false\n' >"$root/etc/krb5.conf"
}

make_shares() {
    local share
    for share in "$@"; do
        { mkdir -p -- "$root$share" && mount --rbind "$share" "$root$share"; } || fail "$share could not be shared"
    done
}

make_root() {
    local disks
    mapfile -t disks </proc/self/mountinfo
    must mount -t tmpfs -o mode=755 vorn-lab "$folder/space"
    mkdir "$root"
    overlay / "$root" || fail "no copy-on-write view of / could be mounted. The file system of / may be an overlay" \
        "in an overlay already (a container in a container); a real machine or a plain container works"
    overlay_other_disks
    must mount -t proc -o nosuid,nodev,noexec proc "$root/proc"
    mount -t sysfs -o ro,nosuid,nodev,noexec sysfs "$root/sys" || true
    make_devices
    make_fresh
    make_shares "$@"
}

# Inside a chroot, pivot_root is refused; another chroot serves as well there.
enter_root() {
    cd "$root" || fail "$root is gone"
    mkdir -p tmp/machine
    if pivot_root . tmp/machine 2>/dev/null; then
        must umount -l /tmp/machine
        rmdir /tmp/machine
        move=()
    else
        rmdir tmp/machine
        move=(chroot .)
    fi
}

[[ -d $folder ]] || fail "$folder is gone"
remember_init
# No mount is to reach the machine. In a chroot "/" is no mount, and what is mounted below must be private already.
mount --make-rprivate / 2>/dev/null || ! grep -q ' shared:' /proc/self/mountinfo ||
    fail "mounts in this chroot are shared with the machine"
exec {ready}>"$folder/ready"
must hostname "$name"
must ip link set lo up
echo 1 >/proc/sys/net/ipv6/conf/all/disable_ipv6 2>/dev/null || true

move=()
if [[ $kind == switch ]]; then
    must mount -t proc proc /proc
    # Left to itself, a bridge takes the lowest address of its ports: each cable that is plugged in or pulled out could
    # change it, and for seconds the hosts' questions to the name server would go to an address that is gone.
    must ip link add br0 address 02:00:0a:4d:00:01 type bridge
    must ip addr add "$(<"$folder/address")/24" dev br0
    must ip link set br0 up
    # Packets for elsewhere are swallowed here, as a real gateway does with a dead network.
    echo 0 >/proc/sys/net/ipv4/ip_forward
else
    make_root "$@"
    enter_root
fi
printf 'ready\n' >&"$ready"
exec {ready}>&- </dev/null
# shellcheck disable=SC2016 # expanded by the inner shell
exec "${move[@]}" /usr/bin/env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin LC_ALL=C.UTF-8 HOME=/root \
    setpriv --bounding-set=-sys_time,-sys_module,-sys_boot,-sys_rawio,-wake_alarm,-syslog \
    bash -c 'cd /; while true; do sleep infinity & wait "$!"; done'
