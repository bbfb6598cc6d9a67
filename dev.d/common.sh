# What the commands share: words, steps with their times, logs.
# shellcheck shell=bash

LOGS=$ROOT/build/logs
LOG=/dev/null  # until start_log

# Where the reader looks, errors and results come in one order.
say() {
    printf '%s\n' "$*"
}

die() {
    printf '\nFAILED: %s\n' "$*" >&2
    exit 1
}

wrong_usage() {
    printf '%s "./dev %s --help" tells what it takes.\n' "$1" "$COMMAND" >&2
    exit 2
}

seconds_since() {
    local now=$EPOCHREALTIME
    printf '%d.%d' $(((${now/./} - ${1/./}) / 1000000)) $(((${now/./} - ${1/./}) / 100000 % 10))
}

# A fresh log for this command.
start_log() {
    LOG=$LOGS/$COMMAND.log
    { mkdir -p "$LOGS" && : >"$LOG"; } || die "the folder ${LOGS#"$ROOT"/} can't be written"
}

# step [--title TEXT] COMMAND...: runs it with its output in the log. Shows what runs and how long it took, and the end
# of the output when it failed. Answers the command's result.
step() {
    local title="" result=0 begin offset
    if [[ $1 == --title ]]; then
        title=$2
        shift 2
    fi
    printf '  %-62s' "${title:-\$ $*}"
    begin=$EPOCHREALTIME
    printf '\n$ %s\n' "$*" >>"$LOG"
    offset=$(stat -c %s "$LOG")
    "$@" >>"$LOG" 2>&1 </dev/null || result=$?
    printf ' %8s s%s\n' "$(seconds_since "$begin")" "$( ((result == 0)) || printf '  failed (%d)' "$result")"
    if ((result != 0)); then
        printf '    the end of its output; all of it is in %s\n' "${LOG#"$ROOT"/}"
        tail -c "+$((offset + 1))" "$LOG" | tail -n 60 | sed 's/^/    | /'
    fi
    return "$result"
}

interrupted() {
    printf '\nFAILED: interrupted\n' >&2
    exit 130
}

# supervise SIGNAL COMMAND...: runs it, and ends it with the signal when this command is interrupted.
supervise() {
    local signal=$1 child result=0
    shift
    "$@" </dev/null &
    child=$!
    # shellcheck disable=SC2064 # this child, now
    trap "kill -$signal $child 2>/dev/null || true; { wait $child || true; } 2>/dev/null; interrupted" INT TERM
    wait "$child" || result=$?
    trap interrupted INT TERM
    return "$result"
}

cores() {
    printf '%s' "${VORN_JOBS:-$(nproc)}"
}
