# bash completion for vornctl: the program itself knows what may come next.
# shellcheck shell=bash

_vornctl() {
    local candidate
    COMPREPLY=()
    while IFS= read -r candidate; do
        COMPREPLY+=("$candidate")
    done < <("$1" __complete -- "${COMP_WORDS[@]:1:COMP_CWORD}" 2>/dev/null)
}

complete -o default -F _vornctl vornctl
