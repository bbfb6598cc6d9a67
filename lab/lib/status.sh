# What there is in the lab.
# shellcheck shell=bash disable=SC2153 # STATE is another variable than state

running_or_stopped() {
    if "$@"; then
        say running
    else
        say stopped
    fi
}

status() {
    local host kind state faults any=false
    (($# == 0)) || wrong_usage "\"status\" takes nothing."
    for host in $(hosts); do
        [[ $host != "$SWITCH" ]] || continue
        any=true
        kind=$(<"$STATE/hosts/$host/kind")
        faults=""
        if is_gone "$STATE/hosts/$host/init"; then
            state=down
        elif [[ $kind == controller ]]; then
            state="up, $(domain_of "$host") $(running_or_stopped controller_runs "$host")"
            ! [[ -e $STATE/hosts/$host/frozen ]] || state+=", frozen"
            ! [[ -s $STATE/hosts/$host/faults ]] || faults=", faults: $(paste -sd , "$STATE/hosts/$host/faults")"
        else
            state="up, vornd $(running_or_stopped vornd_runs "$host")"
            ! httpd_runs "$host" || state+=", vorn-httpd at $(httpd_url "$host")"
        fi
        printf '%-12s %-12s %s\n' "$host" "$(address_of "$host")" "$state$faults"
    done
    $any || die "no lab is up in $STATE"
}

users() {
    (($# == 0)) || wrong_usage "\"users\" takes nothing."
    awk -F '|' '
        BEGIN { printf "%-8s %-14s %-14s %-13s %s\n", "domain", "name", "password", "state", "what it is for" }
        { for (i = 1; i <= NF; i++) gsub(/^[ \t]+|[ \t]+$/, "", $i) }
        $1 == "user" { printf "%-8s %-14s %-14s %-13s %s\n", $2, $3, $4, $5, $8 }
        $1 == "local" { printf "%-8s %-14s %-14s %-13s %s\n", "(nas)", $2, $3, "", $5 }' "$LAB_HOME/accounts.conf"
}
