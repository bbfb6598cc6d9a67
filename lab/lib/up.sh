# Bringing a lab up.
# shellcheck shell=bash disable=SC2034,SC2153 # variables shared with the files that this one stands beside

WITH_TRUST=false
WITH_NT4=false
WITH_AD=true
ONLY_NEW=false
APPLIANCES=(nas1)
SHARES=()
WATCHED=""

read_up_options() {
    while (($# > 0)); do
        case $1 in
            --trust) WITH_TRUST=true ;;
            --nt4) WITH_NT4=true ;;
            --no-ad) WITH_AD=false ;;
            --no-cache) USE_CACHE=false ;;
            --only-new) ONLY_NEW=true ;;
            --appliances | --bulk | --stage | --share | --with-pid)
                (($# > 1)) || wrong_usage "$1 takes a value."
                read_up_value "$1" "$2"
                shift
                ;;
            *) wrong_usage "\"up\" takes no \"$1\"." ;;
        esac
        shift
    done
    if ! $WITH_AD; then
        { ! $WITH_TRUST && ((BULK == 0)); } || wrong_usage "--trust and --bulk don't go together with --no-ad."
    fi
}

read_up_value() {
    case $1 in
        --appliances) read_appliances "$2" ;;
        --bulk)
            [[ $2 =~ ^[1-9][0-9]{0,5}$ ]] || wrong_usage "--bulk takes a number of users, such as 10000."
            BULK=$2
            ;;
        --stage)
            STAGE=$(readlink -f -- "$2") || wrong_usage "There is no folder \"$2\"."
            check_stage
            ;;
        --share)
            [[ -d $2 ]] || wrong_usage "There is no folder \"$2\" to share."
            SHARES+=("$(readlink -f -- "$2")")
            ;;
        --with-pid)
            { [[ $2 =~ ^[1-9][0-9]{0,9}$ ]] && start_of "$2" >/dev/null; } || wrong_usage "There is no process $2."
            WATCHED=$2
            ;;
    esac
}

read_appliances() {
    local name
    IFS=, read -ra APPLIANCES <<<"$1"
    for name in "${APPLIANCES[@]}"; do
        # The name is a NetBIOS name, too, and names a network plug.
        [[ $name =~ ^[a-z][a-z0-9-]{0,11}$ ]] || wrong_usage "\"$name\" can't be a host: up to 12 of a-z, 0-9 and -."
        if is_controller "$name" || [[ $name == "$SWITCH" ]]; then
            wrong_usage "\"$name\" is the lab's own host."
        fi
    done
    ((${#APPLIANCES[@]} <= 100)) || wrong_usage "A lab has 100 appliances at most."
    [[ $(printf '%s\n' "${APPLIANCES[@]}" | sort | uniq -d) == "" ]] || wrong_usage "An appliance is named twice."
}

check_machine() {
    local program missing=()
    ((EUID == 0)) || die "only root can make namespaces. Run this as root"
    for program in samba smbd nmbd winbindd net wbinfo samba-tool kinit dig nft unshare nsenter setpriv ip busybox \
        cron curl python3 tar flock; do
        command -v "$program" >/dev/null || missing+=("$program")
    done
    ((${#missing[@]} == 0)) ||
        die "these programs are missing: ${missing[*]}. \"./dev lab up\" installs what the lab needs"
    [[ $(stat -c %A /) == *[xt] ]] ||
        die "this machine's \"/\" is closed to others, and the domains' services would refuse all accounts. chmod 755 /"
    unshare --pid --fork --mount --net --uts --ipc --propagation unchanged true 2>/dev/null ||
        die "this machine does not let root make namespaces. In a container: start it privileged (docker: --privileged)"
}

up() {
    local failed=false
    read_up_options "$@"
    check_machine
    check_state_folder
    lock_state
    if $ONLY_NEW && any_host_is_up; then
        die "a lab is up already in $STATE"
    fi
    take_down_hosts
    trap give_up EXIT
    trap 'exit 130' INT TERM HUP
    remember "$STATE/up" || die "$STATE can't be written"
    [[ -z $WATCHED ]] || start_watchdog "$WATCHED"
    make_hosts
    start_resolver
    make_controllers
    ! $WITH_AD || lock_accounts
    ! $WITH_TRUST || make_trust
    set_up_appliances
    trap - EXIT INT TERM HUP
    rm -f -- "$STATE/up"
    report "ok: the lab is up: $(hosts | grep -v "^$SWITCH\$" | paste -sd ' ')"
}

any_host_is_up() {
    local record
    for record in "$STATE"/hosts/*/init; do
        is_gone "$record" || return 0
    done
    return 1
}

# A lab that could not be brought up leaves nothing, just as one that was interrupted.
give_up() {
    local result=$?
    trap - EXIT
    trap '' INT TERM HUP
    ((result != 130)) || printf 'lab: interrupted\n' >&2
    take_down_hosts
    remove_state
    printf 'lab: nothing of it is left\n' >&2
    exit "$result"
}

make_hosts() {
    local name number=100
    make_host "$SWITCH" switch "$GATEWAY"
    for name in dc1 dc2 pdc; do
        case $name in
            dc1) $WITH_AD || continue ;;
            dc2) $WITH_TRUST || continue ;;
            pdc) $WITH_NT4 || continue ;;
        esac
        make_host "$name" controller "$(address_of "$name")"
    done
    for name in "${APPLIANCES[@]}"; do
        number=$((number + 1))
        make_host "$name" appliance "10.77.0.$number"
    done
    report "hosts made and wired"
}

# start_resolver: the name server that controllers ask for what they don't know.
start_resolver() {
    local host zone zones=()
    for host in dc1 dc2; do
        [[ -d $STATE/hosts/$host ]] || continue
        zone=$(realm_of "$host")
        zones+=("${zone,,}=$(address_of "$host")")
    done
    start_daemon "$SWITCH" "$STATE/resolver.log" python3 "$LAB_HOME/resolver.py" "$GATEWAY" "${zones[@]}"
    daemon_answers 30 grep -qs '^ready' "$STATE/resolver.log" ||
        die_with "$STATE/resolver.log" "the name server of the switch could not be started"
}

# All controllers at once; each of them speaks for itself when it fails.
make_controllers() {
    local host job jobs=()
    for host in dc1 dc2 pdc; do
        [[ -d $STATE/hosts/$host ]] || continue
        make_controller "$host" {LOCK}<&- &
        jobs+=("$!")
    done
    for job in "${jobs[@]}"; do
        wait "$job" || failed=true
    done
    ! $failed || exit 1
}

make_controller() {
    trap - EXIT INT TERM HUP
    if [[ $1 == pdc ]]; then
        make_nt4
        start_nt4
        await_nt4
    else
        make_directory "$1"
        start_directory "$1"
        await_directory "$1"
    fi
}

set_up_appliances() {
    local name
    for name in "${APPLIANCES[@]}"; do
        set_up_appliance "$name"
    done
    report "appliances set up: ${APPLIANCES[*]}${STAGE:+, with $STAGE}"
}

# The lab ends with the process that asked for it, however that ends.
start_watchdog() {
    local start
    start=$(start_of "$1") || die "there is no process $1"
    # shellcheck disable=SC2016 # expanded by the inner shell
    setsid bash -c '. "$1/lib/process.sh"
        remember "$LAB_DIR/watchdog" || exit 1
        while [[ $(start_of "$2") == "$3" ]]; do
            # Looks at the process five times a second and ends with it.
            tail --pid="$2" --sleep-interval=0.2 -f /dev/null
        done
        exec "$1/lab" down' watchdog "$LAB_HOME" "$1" "$start" </dev/null >/dev/null 2>&1 {LOCK}<&- &
    disown "$!"
    until_true 15 test -s "$STATE/watchdog" || die "the watchdog could not be started"
}
