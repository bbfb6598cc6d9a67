#!/bin/bash
# A machine for tests, in namespaces of its own: launch.sh ROOT FOLDER systemd|plain, with mounts of its own. Writes the
# id of the machine's first process, as seen from here, into FOLDER/init, and ends, with all of the machine, when its
# input ends.
set -uo pipefail
trap '' HUP INT TERM

root=$1
folder=$2
kind=$3
group=""
reader=""

clean_up() {
    local pid
    pid=$(cat -- "$folder/init" 2>/dev/null) && kill -KILL "$pid" 2>/dev/null
    [[ -z $reader ]] || kill -KILL "$reader" 2>/dev/null
    wait 2>/dev/null
    if [[ -n $group ]]; then
        # A group goes when the last process in it is gone, this one included.
        printf '%d\n' "$$" >"${group%/*}/cgroup.procs"
        for _ in {1..50}; do
            find "$group" -depth -type d -exec rmdir {} + 2>/dev/null
            [[ -d $group ]] || break
            sleep 0.1
        done
    fi
}

# The machine's own tree of control groups, which its systemd needs, is a branch of this machine's.
make_group() {
    local path
    mkdir "$folder/groups" && mount -t cgroup2 cgroup2 "$folder/groups" || return 1
    path=$(sed -n 's/^0:://p' /proc/self/cgroup)
    group=$folder/groups${path%/}/vorn-package-test-$$
    mkdir "$group" && printf '%d\n' "$$" >"$group/cgroup.procs"
}

trap clean_up EXIT
if [[ $kind == systemd ]]; then
    make_group || { printf 'no control groups of its own can be had for the machine\n' >&2 && exit 1; }
fi
unshare --mount --pid --fork --net --uts --ipc --cgroup --propagation unchanged \
    bash "$(dirname -- "$0")/first.sh" "$root" "$folder" "$kind" </dev/null &
machine=$!
# Nothing comes: the one who writes there is alive, or gone.
cat <&0 >/dev/null &
reader=$!
wait -n "$machine" "$reader"
