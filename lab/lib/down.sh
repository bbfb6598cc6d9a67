# Taking a lab down, whatever state it is in.
# shellcheck shell=bash

# Processes that entered a host from outside don't end with it; one that stands still would keep the host from ending.
# Only a host that is ending is looked at: a number of a network that is gone may be another's by now.
end_visitors() {
    local folder network visitor
    for folder in "$STATE"/hosts/*/; do
        if [[ -s $folder/network ]] && ! is_gone "$folder/init"; then
            network=$(<"$folder/network")
            network=${network//[!0-9]/}
            while IFS=/ read -r _ _ visitor _; do
                kill -KILL "$visitor" 2>/dev/null || true
            done < <(find /proc/[1-9]*/ns/net -maxdepth 0 -lname "net:?$network?" 2>/dev/null)
        fi
    done
}

# Ends every process that was remembered, the command that brings the lab up first; with the first process of a host go
# all others of it, its mounts, plugs and files. Repeated until nothing is alive, since a killed "up" may just have made
# another host.
take_down_hosts() {
    local limit=$((SECONDS + 20)) file alive=true round=0
    while $alive; do
        alive=false
        for file in "$STATE"/up "$STATE"/watchdog "$STATE"/hosts/*/holder "$STATE"/hosts/*/init; do
            ! end_process "$file" || alive=true
        done
        ! $alive || sleep 0.02
        ((++round % 25)) || end_visitors
        ((SECONDS < limit)) || die "some processes of the lab don't end, see $STATE/hosts"
    done
    rm -rf --one-file-system -- "${STATE:?}"/*
}

remove_state() {
    rm -rf --one-file-system -- "${STATE:?}"
}

down() {
    (($# == 0)) || wrong_usage "\"down\" takes nothing."
    ((EUID == 0)) || die "only root can take a lab down"
    check_state_folder
    if [[ ! -e $STATE ]]; then
        say "ok: there is no lab in $STATE"
        return
    fi
    # The one who brings it up holds the lock.
    end_process "$STATE/up" || true
    lock_state
    take_down_hosts
    remove_state
    report "ok: the lab is gone"
}
