# The hosts: which there are, and how they are made, wired and entered.
# shellcheck shell=bash disable=SC2034 # used by the files that read this one

SWITCH=switch
GATEWAY=10.77.0.1
# Hosts share the machine's clock, kernel and disks: what would reach them is taken from every process of a host.
TAKEN=-sys_time,-sys_module,-sys_boot,-sys_rawio,-wake_alarm,-syslog

domain_of() {
    case $1 in
        dc1) say LAB ;;
        dc2) say OTHER ;;
        pdc) say NT4DOM ;;
        *) return 1 ;;
    esac
}

realm_of() {
    case $1 in
        dc1) say LAB.TEST ;;
        dc2) say OTHER.TEST ;;
        *) return 1 ;;
    esac
}

# address_of HOST: fixed for the controllers; the appliances have theirs in the order in which they were named.
address_of() {
    case $1 in
        "$SWITCH") say "$GATEWAY" ;;
        dc1) say 10.77.0.10 ;;
        dc2) say 10.77.0.30 ;;
        pdc) say 10.77.0.40 ;;
        *) cat -- "$STATE/hosts/$1/address" 2>/dev/null ;;
    esac
}

is_controller() {
    domain_of "$1" >/dev/null
}

hosts() {
    local folder
    for folder in "$STATE"/hosts/*/; do
        [[ -d $folder ]] && basename -- "$folder"
    done
}

# need_host NAME: fails in one line when there is no such host, or it is down.
need_host() {
    [[ $1 =~ ^[a-z][a-z0-9-]*$ && -d $STATE/hosts/$1 ]] || die "there is no host \"$1\" in the lab at $STATE"
    pid_in "$STATE/hosts/$1/init" >/dev/null || die "the host $1 is down"
}

# enter HOST: sets ENTER, the words to put in front of a command of that host. What runs there ends with its caller. With
# ENTER_WITHOUT_NETWORK it stays in the network of the machine.
enter() {
    local init network=--net
    init=$(pid_in "$STATE/hosts/$1/init") || die "the host $1 is down"
    [[ -z ${ENTER_WITHOUT_NETWORK:-} ]] || network=""
    ENTER=(nsenter --target "$init" --pid --mount ${network:+"$network"} --uts --ipc --root --wd --
        setpriv "--bounding-set=$TAKEN" --pdeathsig KILL --)
}

inside() {
    local ENTER
    enter "$1"
    shift
    "${ENTER[@]}" "$@"
}

# start_daemon HOST LOG COMMAND...: in a session of its own, a child of the host's first process, its output at the end
# of the log. Sets DAEMON_HOST and DAEMON, the process as the host counts.
start_daemon() {
    local log=$2 ENTER
    DAEMON_HOST=$1
    enter "$1"
    shift 2
    # shellcheck disable=SC2016 # expanded inside
    DAEMON=$("${ENTER[@]}" env -i "PATH=$PATH" LC_ALL=C.UTF-8 HOME=/root \
        bash -c 'setsid "$@" </dev/null >&3 2>&1 3>&- & echo "$!"' start "$@" 3>>"$log" {LOCK}<&-) ||
        die "$1 could not be started in $DAEMON_HOST"
}

# ended_or COMMAND...: whether the daemon that was started last has ended, or the command succeeds.
ended_or() {
    ! inside "$DAEMON_HOST" test -d "/proc/$DAEMON" || "$@"
}

# daemon_answers SECONDS COMMAND...: waits until the command succeeds; no longer than the daemon started last lives.
daemon_answers() {
    local seconds=$1
    shift
    until_true "$seconds" ended_or "$@" && "$@"
}

# make_host NAME KIND ADDRESS: KIND is switch, controller or appliance. The first thing that the new process does is to
# remember itself, so that "down" finds it whatever happens here.
make_host() {
    local name=$1 kind=$2 address=$3 folder=$STATE/hosts/$1
    mkdir -p -- "$folder/space"
    printf '%s\n' "$kind" >"$folder/kind"
    printf '%s\n' "$address" >"$folder/address"
    # shellcheck disable=SC2016 # expanded by the inner shell
    setsid bash -c '. "$1/lib/process.sh"
        remember "$2/holder" || exit 1
        exec unshare --pid --fork --mount --net --uts --ipc --kill-child=SIGKILL --propagation unchanged \
            bash "$1/lib/init.sh" "$2" "$3" "$4" "${@:5}"' holder "$LAB_HOME" "$folder" "$name" "$kind" "${SHARES[@]}" \
        </dev/null >"$folder/init.log" 2>&1 {LOCK}<&- &
    disown "$!"
    until_true 30 host_is_made "$folder" "$!" || true
    [[ -s $folder/ready ]] || die "the host $name could not be made: $(tail -n 1 -- "$folder/init.log")"
    readlink "/proc/$(pid_in "$folder/init")/ns/net" >"$folder/network" || die "the host $name went down"
    [[ $name == "$SWITCH" ]] || wire "$name" "$address"
}

# host_is_made FOLDER PID: also when it is certain that it never will be.
host_is_made() {
    [[ -s $1/ready ]] || ! start_of "$2" >/dev/null
}

# The same for a host that is made anew: the others remember it for a while.
hardware_address_of() {
    local -a bytes
    IFS=. read -ra bytes <<<"$1"
    printf '02:00:%02x:%02x:%02x:%02x' "${bytes[@]}"
}

# Plugs a cable into the host and the switch.
wire() {
    local name=$1 address=$2 switch init
    switch=$(pid_in "$STATE/hosts/$SWITCH/init") || die "the switch went down"
    init=$(pid_in "$STATE/hosts/$name/init") || die "the host $name went down"
    {
        nsenter --target "$switch" --net -- ip link add "p-$name" type veth \
            peer name eth0 address "$(hardware_address_of "$address")" netns "$init" &&
            nsenter --target "$switch" --net -- ip link set "p-$name" master br0 up &&
            nsenter --target "$init" --net -- ip addr add "$address/24" brd + dev eth0 &&
            nsenter --target "$init" --net -- ip link set eth0 up &&
            nsenter --target "$init" --net -- ip route add default via "$GATEWAY"
    } || die "the host $name could not be wired to the switch"
}

# write_file HOST PATH: from the input; what was there, also a link, goes.
write_file() {
    # shellcheck disable=SC2016 # expanded inside
    inside "$1" sh -c 'rm -f -- "$1" && cat >"$1"' write "$2"
}

# point_dns HOST ADDRESS...: the host's name servers.
point_dns() {
    local host=$1
    shift
    {
        (($# == 0)) || printf 'nameserver %s\n' "$@"
        printf 'options timeout:1 attempts:2\n'
    } | write_file "$host" /etc/resolv.conf
}
