#!/bin/bash
# The first process of a machine for tests: first.sh ROOT FOLDER systemd|plain. What the machine writes goes to memory.
set -euo pipefail

below=$1
folder=$2
kind=$3
root=$folder/root

# Of this process as the machine outside sees it: /proc is still that one's.
read -r pid _ </proc/self/stat
printf '%d\n' "$pid" >"$folder/init"

mkdir "$folder/memory" "$root"
mount -t tmpfs -o mode=755 memory "$folder/memory"
mkdir "$folder/memory"/{upper,work}
chmod --reference="$below" "$folder/memory/upper"
mount -t overlay -o "lowerdir=$below,upperdir=$folder/memory/upper,workdir=$folder/memory/work" overlay "$root"

mount -t proc -o nosuid,nodev,noexec proc "$root/proc"
# Settings of the kernel are the outer machine's, but for those of the network.
mount --bind "$root/proc/sys" "$root/proc/sys"
mount -o remount,bind,ro "$root/proc/sys"
mount --bind /proc/sys/net "$root/proc/sys/net" 2>/dev/null || true
mount -t sysfs -o ro,nosuid,nodev,noexec sysfs "$root/sys"
mount -t tmpfs -o mode=755,nosuid,nodev run "$root/run"
mount -t tmpfs -o mode=1777,nosuid,nodev tmp "$root/tmp"
mount -t tmpfs -o mode=755,nosuid dev "$root/dev"
mkdir "$root/dev/pts" "$root/dev/shm" "$root/run/lock"
chmod 1777 "$root/run/lock"
for device in null zero full random urandom tty; do
    : >"$root/dev/$device"
    mount --bind "/dev/$device" "$root/dev/$device"
done
mount -t devpts -o newinstance,ptmxmode=0666,mode=0620,gid=5 devpts "$root/dev/pts"
mount -t tmpfs -o mode=1777,nosuid,nodev shm "$root/dev/shm"
ln -s pts/ptmx "$root/dev/ptmx"
ln -s /proc/self/fd "$root/dev/fd"
if [[ $kind == systemd ]]; then
    mount -t cgroup2 -o nosuid,nodev,noexec cgroup2 "$root/sys/fs/cgroup"
fi

hostname nas1
printf 'nas1\n' >"$root/etc/hostname"
printf '127.0.0.1 localhost\n10.78.0.2 nas1\n' >"$root/etc/hosts"
ip link set lo up
ip link add eth0 type veth peer name wire0
ip addr add 10.78.0.2/24 dev eth0
ip link set wire0 up
ip link set eth0 up

# What reaches past the namespaces is taken from every process of the machine.
words=(env -i PATH=/usr/sbin:/usr/bin:/sbin:/bin container=vorn-package-test
    setpriv "--bounding-set=-sys_time,-sys_module,-sys_boot,-sys_rawio,-wake_alarm,-syslog")
if [[ $kind == systemd ]]; then
    words+=(/lib/systemd/systemd --log-target=journal --show-status=no)
else
    # shellcheck disable=SC2016 # expanded by the inner shell
    words+=(bash -c 'while true; do sleep infinity & wait "$!"; done')
fi
mkdir "$root/tmp/outside"
exec {top}<"$root" {ready}>"$folder/ready"
# In a chroot, pivot_root is refused. To enter one's own namespace leads out of it, and what is open stays open.
# shellcheck disable=SC2016 # expanded by the inner shell
exec nsenter --mount=/proc/self/ns/mnt -- bash -euc 'top=$1 ready=$2
    shift 2
    cd "/proc/self/fd/$top"
    pivot_root . tmp/outside
    cd /
    umount -l /tmp/outside
    rmdir /tmp/outside
    # From now on this process is the way into the machine, and not into the one outside.
    echo ready >&"$ready"
    exec {top}<&- {ready}>&-
    exec "$@"' pivot "$top" "$ready" "${words[@]}"
