# What all parts of the lab share: words, times, the lab's folder and its lock.
# shellcheck shell=bash disable=SC2034 # used by the files that read this one

STATE=${LAB_DIR:-/run/vorn-lab}
CACHE=${LAB_CACHE:-${XDG_CACHE_HOME:-/var/cache}/vorn-lab}
BEGIN=$EPOCHREALTIME
# Open from the start, so that the processes that stay behind can always close it.
exec {LOCK}</dev/null

say() {
    printf '%s\n' "$*"
}

die() {
    printf 'lab: %s\n' "$*" >&2
    exit 1
}

wrong_usage() {
    printf 'lab: %s "lab --help" tells more.\n' "$*" >&2
    exit 2
}

milliseconds_since() {
    local now=$EPOCHREALTIME
    printf '%d' $(((${now/./} - ${1/./}) / 1000))
}

# report TEXT: a step that is done, with the time since the command began.
report() {
    printf '%7d ms  %s\n' "$(milliseconds_since "$BEGIN")" "$*"
}

# die_with LOG TEXT: says what failed and shows the end of its log, which may be gone a moment later.
die_with() {
    local log=$1
    shift
    if [[ -s $log ]]; then
        printf 'lab: the end of the output:\n' >&2
        tail -n 15 -- "$log" | sed 's/^/    | /' >&2
    fi
    die "$*"
}

# until_true SECONDS COMMAND...: repeats the command until it succeeds; 1 when the time is over.
until_true() {
    local deadline=$((${EPOCHREALTIME/./} + $1 * 1000000))
    shift
    until "$@"; do
        ((${EPOCHREALTIME/./} < deadline)) || return 1
        sleep 0.03
    done
}

# The folder goes with "down", whatever is in it, so it must be one that a lab has made.
check_state_folder() {
    [[ $STATE == /* ]] || wrong_usage "LAB_DIR is to begin with \"/\", not \"$STATE\"."
    [[ $STATE != *[,:\\[:space:]]* ]] || wrong_usage "LAB_DIR can't hold blanks, commas, colons or backslashes."
    [[ ! -L $STATE ]] || die "$STATE is a link; LAB_DIR names another folder"
    [[ -e $STATE ]] || return 0
    [[ -d $STATE && -O $STATE ]] || die "$STATE is not a folder of root; LAB_DIR names another one"
    if [[ ! -e $STATE/.vorn-lab && -n $(ls -A -- "$STATE") ]]; then
        die "$STATE holds something that is not of a lab; LAB_DIR names another folder"
    fi
}

# Makes the folder where it is missing and holds its lock until the command ends. The folder of another command may go
# while this one waits; then there is a new one to lock.
lock_state() {
    local limit=$((SECONDS + ${1:-60}))
    while true; do
        (umask 077 && mkdir -p -- "$STATE") || die "the folder $STATE can't be made"
        exec {LOCK}<&-
        exec {LOCK}<"$STATE" || die "the folder $STATE can't be opened"
        flock -w $((limit > SECONDS ? limit - SECONDS : 0)) "$LOCK" || die "another command holds the lab in $STATE"
        [[ /proc/self/fd/$LOCK -ef $STATE ]] && break
    done
    check_state_folder
    : >"$STATE/.vorn-lab"
}
