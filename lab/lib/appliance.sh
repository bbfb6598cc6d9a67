# The appliances: a Debian machine each, with the project's programs when there is a staged tree.
# shellcheck shell=bash disable=SC2016,SC2153 # words in single quotes are expanded inside the host

STAGE=""
VORND_SECONDS=30

# set_up_appliance HOST: what every machine has that may become a member: names, a system log, cron.
set_up_appliance() {
    local host=$1
    if [[ -d $STATE/hosts/dc1 ]]; then
        point_dns "$host" "$(address_of dc1)"
    else
        point_dns "$host" "$GATEWAY"
    fi
    inside "$host" sh -c '
        sed -i -E "s/^(passwd|group):.*/\1:         files winbind/" /etc/nsswitch.conf
        printf "127.0.0.1 localhost\n%s %s\n" "$1" "$2" >/etc/hosts' set-up "$(address_of "$host")" "$host" ||
        die "the appliance $host could not be set up"
    make_local_accounts "$host"
    [[ -z $STAGE ]] || put_stage "$host"
    printf '%s' "$STAGE" >"$STATE/hosts/$host/stage"
    ((${#SHARES[@]} == 0)) || printf '%s\n' "${SHARES[@]}" >"$STATE/hosts/$host/shares"
    start_daemon "$host" "$STATE/$host.syslogd.log" busybox syslogd -n -O /var/log/syslog
    start_daemon "$host" "$STATE/$host.cron.log" cron -f
    until_true 15 inside "$host" test -S /dev/log || die_with "$STATE/$host.syslogd.log" "$host has no system log"
}

# The tree is copied, so that each appliance writes its own. Folders that are links on this machine (/lib) stay links.
put_stage() {
    check_stage
    tar --owner=root --group=root -C "$STAGE" -cf - . |
        inside "$1" tar -C / --keep-directory-symlink --no-overwrite-dir -xpf - ||
        die "the staged tree $STAGE could not be put into $1"
}

check_stage() {
    [[ -d $STAGE/usr/vorn ]] || die "$STAGE is no staged tree: it has no usr/vorn"
}

need_appliance() {
    need_host "$1"
    [[ $(<"$STATE/hosts/$1/kind") == appliance ]] || wrong_usage "$1 is no appliance."
}

# vornd HOST start|stop|kill|log|status
vornd() {
    (($# == 2)) || wrong_usage "\"vornd\" takes an appliance and one of start, stop, kill, status, log."
    need_appliance "$1"
    case $2 in
        start) start_vornd "$1" ;;
        stop) end_vornd "$1" TERM ;;
        kill) end_vornd "$1" KILL ;;
        status)
            vornd_runs "$1" || die "vornd is not running in $1"
            say "ok: vornd is running in $1"
            ;;
        log)
            ! [[ -e $STATE/$1.vornd.log ]] || cat -- "$STATE/$1.vornd.log"
            inside "$1" grep -a ' vorn[a-z-]*\[[0-9]*\]: ' /var/log/syslog || true
            ;;
        *) wrong_usage "\"vornd\" knows start, stop, kill, status and log, not \"$2\"." ;;
    esac
}

# The server's tasks are the same program, so it is known by its process id.
vornd_pid() {
    local pid
    pid=$(cat -- "$STATE/hosts/$1/vornd" 2>/dev/null) || return 1
    [[ $(inside "$1" readlink "/proc/$pid/exe") == /usr/vorn/sbin/vornd ]] && printf '%s' "$pid"
}

vornd_runs() {
    vornd_pid "$1" >/dev/null
}

vornd_is_gone() {
    ! vornd_runs "$1"
}

vornd_answers() {
    inside "$1" curl --silent --output /dev/null --max-time 2 --unix-socket /run/vorn/vornd.sock \
        http://localhost/webapi
}

start_vornd() {
    local host=$1 log=$STATE/$1.vornd.log begin=$EPOCHREALTIME
    inside "$host" test -x /usr/vorn/sbin/vornd || die "$host has no vornd; bring the lab up with --stage FOLDER"
    ! vornd_runs "$host" || die "vornd is running in $host"
    start_daemon "$host" "$log" /usr/vorn/sbin/vornd
    printf '%s\n' "$DAEMON" >"$STATE/hosts/$host/vornd"
    daemon_answers "$VORND_SECONDS" vornd_answers "$host" || die_with "$log" "vornd in $host does not answer"
    vornd_runs "$host" || die_with "$log" "vornd in $host has ended"
    say "ok: vornd answers in $host after $(milliseconds_since "$begin") ms"
}

end_vornd() {
    local pid
    pid=$(vornd_pid "$1") || die "vornd is not running in $1"
    inside "$1" kill "-$2" "$pid" || true
    until_true "$VORND_SECONDS" vornd_is_gone "$1" || die "vornd in $1 did not end within $VORND_SECONDS s"
    say "ok: vornd in $1 has ended"
}

# stage FOLDER [HOST...]: newer programs for appliances that are up.
stage() {
    local host
    (($# > 0)) || wrong_usage "\"stage\" takes a folder."
    STAGE=$(readlink -f -- "$1")
    check_stage
    shift
    (($# > 0)) || read -ra hosts_to_stage <<<"$(appliances)"
    for host in "${@:-${hosts_to_stage[@]}}"; do
        need_appliance "$host"
        put_stage "$host"
    done
    say "ok: $STAGE is in ${*:-${hosts_to_stage[*]}}"
}

appliances() {
    local host
    for host in $(hosts); do
        [[ $(<"$STATE/hosts/$host/kind") != appliance ]] || printf '%s ' "$host"
    done
}

# dns HOST ADDRESS|CONTROLLER...|none: the name servers of a host.
dns() {
    local host=${1:-} server servers=()
    (($# >= 2)) || wrong_usage "\"dns\" takes a host, and addresses, controllers or none."
    need_host "$host"
    shift
    for server in "$@"; do
        if is_controller "$server"; then
            servers+=("$(address_of "$server")")
        elif [[ $server =~ ^[0-9a-fA-F.:]+$ ]]; then
            servers+=("$server")
        elif [[ $server != none ]]; then
            wrong_usage "\"$server\" is neither an address nor a controller."
        fi
    done
    point_dns "$host" "${servers[@]}"
    say "ok: $host asks ${servers[*]:-nobody}"
}

# renew HOST: the appliance as it was when the lab came up, whatever was done to it. It keeps its name and address.
renew() {
    local folder address shares=()
    (($# == 1)) || wrong_usage "\"renew\" takes an appliance."
    need_appliance "$1"
    folder=$STATE/hosts/$1
    address=$(<"$folder/address")
    [[ ! -s $folder/stage ]] || STAGE=$(<"$folder/stage")
    [[ ! -s $folder/shares ]] || mapfile -t shares <"$folder/shares"
    SHARES=("${shares[@]}")
    end_process "$folder/init" || true
    end_process "$folder/holder" || true
    until_true 10 is_gone "$folder/init" || die "$1 does not end"
    # The kernel takes its time with the network of a host that is gone; the plug must be free at once.
    inside "$SWITCH" ip link delete "p-$1" 2>/dev/null || true
    rm -rf --one-file-system -- "${folder:?}" "$STATE/$1".{vornd,httpd}.log
    make_host "$1" appliance "$address"
    set_up_appliance "$1"
    say "ok: $1 is as new"
}
