# Processes that are remembered in files: "pid start". The start time tells a process from a later one of the same id.
# shellcheck shell=bash

# start_of PID: in clock ticks since the machine started; fails when there is no such process.
start_of() {
    local line fields
    { read -r line <"/proc/$1/stat"; } 2>/dev/null || return 1
    # The name, in parentheses, may hold blanks.
    read -ra fields <<<"${line##*) }"
    [[ ${fields[0]} != [ZX] ]] || return 1
    printf '%s' "${fields[19]}"
}

# remember FILE [PID]: of this shell unless another is named.
remember() {
    local pid=${2:-$BASHPID} start
    start=$(start_of "$pid") && printf '%s %s\n' "$pid" "$start" >"$1"
}

# pid_in FILE: the process, when it is still the one that was remembered.
pid_in() {
    local pid start
    { read -r pid start <"$1"; } 2>/dev/null || return 1
    [[ $pid =~ ^[1-9][0-9]*$ && -n $start && $(start_of "$pid") == "$start" ]] || return 1
    printf '%s' "$pid"
}

is_gone() {
    ! pid_in "$1" >/dev/null
}

# end_process FILE: kills the process; 0 when there was one. Never this shell.
end_process() {
    local pid
    pid=$(pid_in "$1") && [[ $pid != "$$" ]] && kill -KILL "$pid" 2>/dev/null
}
