# What can go wrong with a controller: packets that vanish or are refused, slowness, a standstill, death.
# shellcheck shell=bash disable=SC2016 # words in single quotes are expanded inside the host

FAULTS=(smb-drop smb-rst 445-drop ldap-drop kdc-drop dns-drop netbios-drop rpc-drop dead unplugged slow)
SLOW_MILLISECONDS=150

# rule_of FAULT: what the controller's firewall does with packets that come in.
rule_of() {
    case $1 in
        smb-drop) say 'tcp dport { 139, 445 } drop' ;;
        smb-rst) say 'tcp dport { 139, 445 } reject with tcp reset' ;;
        445-drop) say 'tcp dport 445 drop' ;;
        ldap-drop) say 'meta l4proto { tcp, udp } th dport { 389, 636, 3268, 3269 } drop' ;;
        kdc-drop) say 'meta l4proto { tcp, udp } th dport { 88, 464 } drop' ;;
        dns-drop) say 'meta l4proto { tcp, udp } th dport 53 drop' ;;
        netbios-drop) say 'udp dport { 137, 138 } drop' ;;
        rpc-drop) say 'tcp dport { 135, 49152-65535 } drop' ;;
        dead) say 'drop' ;;
    esac
}

# fault NAME [CONTROLLER] [--from HOST]
fault() {
    local name="" host="" from="" address=""
    while (($# > 0)); do
        case $1 in
            --from)
                from=${2:-}
                [[ -n $from ]] || wrong_usage "--from takes the name of a host."
                shift
                ;;
            -*) wrong_usage "\"fault\" has no option \"$1\"." ;;
            *)
                if [[ -z $name ]]; then
                    name=$1
                elif [[ -z $host ]]; then
                    host=$1
                else
                    wrong_usage "\"fault\" takes a fault and a controller, not \"$1\" too."
                fi
                ;;
        esac
        shift
    done
    [[ " none ${FAULTS[*]} " == *" ${name:-?} "* ]] || wrong_usage "Faults are: none ${FAULTS[*]}."
    [[ -z $from ]] || { need_host "$from" && address=$(address_of "$from"); }
    if [[ $name == none ]]; then
        [[ -z $from ]] || wrong_usage "\"fault none\" takes no --from."
        clear_faults "$host"
        return
    fi
    host=${host:-dc1}
    is_controller "$host" || wrong_usage "Faults are made at dc1, dc2 or pdc, not at \"$host\"."
    need_host "$host"
    case $name in
        slow) slow "$host" "$address" ;;
        unplugged)
            [[ -z $from ]] || wrong_usage "A cable is unplugged for everybody; \"dead --from\" may be what is meant."
            inside "$SWITCH" ip link set "p-$host" down
            ;;
        *) filter "$host" "$(rule_of "$name")" "$address" ;;
    esac
    printf '%s%s\n' "$name" "${from:+ from $from}" >>"$STATE/hosts/$host/faults"
    say "ok: $host: $name${from:+ for $from}"
}

# Faults add up until "none". What the host asks of itself goes on.
filter() {
    local source=${3:+ip saddr $3 }
    inside "$1" nft "add table inet lab; add chain inet lab fault { type filter hook input priority 0; }
        add rule inet lab fault iif != lo $source$2" || die "the fault could not be made at $1"
}

# Frames from and to the controller, or those that it exchanges with one host, wait in a relay at its plug.
slow() {
    local host=$1 log=$STATE/$1.slow.log
    end_slow "$host"
    start_daemon "$SWITCH" "$log" python3 "$LAB_HOME/slow.py" "$host" "$SLOW_MILLISECONDS" ${2:+"$2"}
    printf '%s\n' "$DAEMON" >"$STATE/hosts/$host/slow"
    daemon_answers 15 grep -qs '^ready' "$log" || die_with "$log" "the slow cable of $host could not be made"
}

end_slow() {
    local host=$1
    [[ -e $STATE/hosts/$host/slow ]] || return 0
    inside "$SWITCH" sh -c 'kill -KILL "$2"
        ip link del "s-$1"
        ip link set "p-$1" promisc off master br0 up' slow "$host" "$(<"$STATE/hosts/$host/slow")" 2>/dev/null ||
        die "the cable of $host could not be put back"
    rm -f -- "$STATE/hosts/$host/slow" "$STATE/$host.slow.log"
}

clear_faults() {
    local host
    [[ -z $1 ]] || { is_controller "$1" || wrong_usage "\"$1\" is no controller."; need_host "$1"; }
    for host in ${1:-$(hosts)}; do
        is_controller "$host" || continue
        pid_in "$STATE/hosts/$host/init" >/dev/null || continue
        inside "$host" sh -c 'nft list table inet lab >/dev/null 2>&1 || exit 0; nft delete table inet lab' ||
            die "the faults of $host could not be cleared"
        end_slow "$host"
        inside "$SWITCH" ip link set "p-$host" up || die "the cable of $host could not be plugged in"
        rm -f -- "$STATE/hosts/$host/faults"
    done
    say "ok: no faults${1:+ at $1}"
}

# signal_controller HOST SIGNAL: to all processes of the controller; its init and what was entered stay untouched. More
# may be born meanwhile, hence the repetition.
signal_controller() {
    inside "$1" bash -c '
        for round in 1 2 3; do
            while read -r folder program; do
                case $program in
                    /usr/sbin/samba* | /usr/sbin/smbd | /usr/sbin/nmbd | /usr/sbin/winbindd | /usr/libexec/samba/* | \
                        /usr/lib/*/samba/*)
                        kill "-$1" "${folder##*/}" 2>/dev/null ;;
                esac
            done < <(find /proc/[1-9]*/exe -maxdepth 0 -printf "%h %l\n")
        done
        true' signal "$2" 2>/dev/null
}

controller_runs() {
    inside "$1" bash -c 'for folder in /proc/[1-9]*; do
            case $(readlink "$folder/exe") in /usr/sbin/samba* | /usr/sbin/smbd) exit 0 ;; esac
        done
        exit 1' runs 2>/dev/null
}

controller_is_gone() {
    ! controller_runs "$1"
}

# need_controller COMMAND HOST...
need_controller() {
    if (($# != 2)) || ! is_controller "$2"; then
        wrong_usage "\"$1\" takes one of dc1, dc2 and pdc."
    fi
    need_host "$2"
}

kill_controller() {
    signal_controller "$1" KILL
    until_true 10 controller_is_gone "$1" || die "the controller of $1 could not be ended"
    say "ok: the controller of $1 is dead"
}

# start_controller HOST [--clock SECONDS]: with a clock that differs from the machine's by so much.
start_controller() {
    local host=$1 clock=${3:-}
    if (($# > 1)) && [[ $2 != --clock || $# != 3 || ! $clock =~ ^[+-]?[0-9]{1,9}$ || $host == pdc ]]; then
        wrong_usage "\"start-dc\" takes a controller of Active Directory with --clock and seconds."
    fi
    controller_is_gone "$host" || die "the controller of $host is running"
    inside "$host" sh -c 'rm -f /run/samba/*.pid'
    if [[ $host == pdc ]]; then
        start_nt4
        await_nt4
        return
    fi
    if [[ -n $clock ]]; then
        start_with_clock "$host" "$clock"
    else
        start_directory "$host"
    fi
    await_directory "$host"
}

# Nothing but the controller's programs sees that clock.
start_with_clock() {
    local library seconds=$2
    [[ $seconds == [+-]* ]] || seconds=+$seconds
    library=$(compgen -G '/usr/lib/*/faketime/libfaketime.so.1') || die "--clock needs the package libfaketime"
    start_daemon "$1" "$STATE/$1.log" env "LD_PRELOAD=$library" "FAKETIME=${seconds}s" \
        samba -F --no-process-group --debug-stdout
}
