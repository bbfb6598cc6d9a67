#!/bin/bash
# Runs a program in a view of this machine of its own: what it changes in /etc, /usr, /var, /run and /tmp goes to memory
# and ends with it, and so do the processes that it leaves behind. Of networks it has its own 127.0.0.1 only. Needs root.
#
#   in_a_machine.sh [--share FOLDER] [--copy FILE TARGET] [--link FILE TARGET]... -- PROGRAM [ARGUMENT...]
#
#   --share FOLDER        keep this folder as it is, wherever it lies: changes in it are real
#   --copy FILE TARGET    a copy of a file, the program's to change
#   --link FILE TARGET    a symbolic link to a file, which has to lie in a shared folder
#
# The program's result is this one's. --inside is for itself.
set -euo pipefail

OVERLAID=(/etc /usr /var)  # copy on write
FRESH=(/run /tmp)          # empty
SPACE=/mnt                 # what holds the layers within the view, or /media when /mnt is needed

fail() {
    printf 'in_a_machine.sh: %s\n' "$*" >&2
    exit 125
}

parse() {
    shares=() pairs=()
    while (($# > 0)); do
        case $1 in
            --share)
                shares+=("$(readlink -e -- "${2:-}")") || fail "there is no folder \"${2:-}\""
                shift 2
                ;;
            --copy | --link)
                [[ -f ${2:-} && ${3:-} == /* ]] || fail "$1 takes a file and an absolute path, not \"${2:-}\" \"${3:-}\""
                pairs+=("$1" "$(readlink -e -- "$2")" "$3")
                shift 3
                ;;
            --)
                shift
                program=("$@")
                choose_space
                return
                ;;
            *) fail "there is no option \"$1\"" ;;
        esac
    done
    fail "no program was named"
}

choose_space() {
    local path
    for path in "${shares[@]}" "${pairs[@]}"; do
        [[ $path != /mnt/* ]] || SPACE=/media
    done
}

overlay() {
    local layer=$SPACE/layers$1
    mkdir -p -- "$layer/upper" "$layer/work"
    chmod --reference="$1" -- "$layer/upper"
    mount -t overlay -o "lowerdir=$1,upperdir=$layer/upper,workdir=$layer/work" overlay "$1" ||
        fail "no copy-on-write view of $1 could be mounted"
}

# What is shared or copied is kept at hand in SPACE while the views are mounted over it.
make_view() {
    local number folder
    mount -t tmpfs -o mode=755 contract "$SPACE"
    for number in "${!shares[@]}"; do
        mkdir -p -- "$SPACE/shares/$number"
        mount --rbind "${shares[number]}" "$SPACE/shares/$number"
    done
    mkdir -p -- "$SPACE/files"
    for ((number = 0; number < ${#pairs[@]}; number += 3)); do
        [[ ${pairs[number]} == --link ]] || cp -- "${pairs[number + 1]}" "$SPACE/files/$number"
    done
    for folder in "${OVERLAID[@]}"; do
        overlay "$folder"
    done
    for folder in "${FRESH[@]}"; do
        mount -t tmpfs -o mode=1777 contract "$folder"
    done
    chmod 755 /run
    for number in "${!shares[@]}"; do
        mkdir -p -- "${shares[number]}"
        mount --rbind "$SPACE/shares/$number" "${shares[number]}"
    done
    place_files
}

place_files() {
    local number target
    for ((number = 0; number < ${#pairs[@]}; number += 3)); do
        target=${pairs[number + 2]}
        mkdir -p -- "$(dirname -- "$target")"
        rm -f -- "$target"
        if [[ ${pairs[number]} == --copy ]]; then
            cp -- "$SPACE/files/$number" "$target"
        else
            ln -s -- "${pairs[number + 1]}" "$target"
        fi
    done
}

inside() {
    local result=0
    parse "$@"
    # Nothing that is mounted here is to reach the machine. In a chroot "/" is no mount, and must be private already.
    mount --make-rprivate / 2>/dev/null || ! grep -q ' shared:' /proc/self/mountinfo ||
        fail "mounts in this chroot are shared with the machine"
    mount -t proc -o nosuid,nodev,noexec proc /proc
    ip link set lo up || fail "the view has no network of its own"
    make_view
    "${program[@]}" || result=$?
    exit "$result"
}

if [[ ${1:-} == --inside ]]; then
    shift
    inside "$@"
fi
parse "$@"
((EUID == 0)) || fail "only root can make a view of the machine"
exec unshare --mount --pid --fork --net --ipc --uts --kill-child=SIGKILL --propagation unchanged \
    bash "${BASH_SOURCE[0]}" --inside "$@"
