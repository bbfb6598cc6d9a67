# The door of an appliance: the web server that browsers of this machine talk to, and the accounts that log in there.
# shellcheck shell=bash disable=SC2016,SC2153 # words in single quotes are expanded inside the host

HTTPD=/usr/vorn/sbin/vorn-httpd
HTTPD_STATE=/var/lib/vorn-httpd
HTTPD_USER=vorn-httpd
HTTPD_SECONDS=15
FIRST_PORT=8443
LAST_PORT=8543

# make_local_accounts HOST: the door's own account, and those of accounts.conf.
make_local_accounts() {
    local name password groups
    inside "$1" sh -c '
        grep -q "^administrators:" /etc/group || groupadd --system administrators
        grep -q "^$1:" /etc/passwd ||
            useradd --system --user-group --no-create-home --home-dir "$2" --shell /usr/sbin/nologin "$1"' \
        accounts "$HTTPD_USER" "$HTTPD_STATE" || die "the accounts of $1 could not be made"
    while IFS='|' read -r _ name password groups _; do
        name=${name//[[:blank:]]/}
        groups=${groups//[[:blank:]]/}
        printf '%s:%s\n' "$name" "${password//[[:blank:]]/}" | inside "$1" sh -c '
            useradd --no-create-home --no-user-group --gid nogroup --shell /usr/sbin/nologin ${2:+--groups "$2"} "$1" &&
                chpasswd --crypt-method SHA512' account "$name" "$groups" ||
            die "the account $name of $1 could not be made"
    done < <(grep '^local ' "$LAB_HOME/accounts.conf")
}

# httpd HOST start|stop|kill|log|status [OPTION...]
httpd() {
    (($# >= 2)) || wrong_usage "\"httpd\" takes an appliance and one of start, stop, kill, status, log."
    need_appliance "$1"
    [[ $2 == start || $# == 2 ]] || wrong_usage "\"httpd $1 $2\" takes nothing more."
    case $2 in
        start) start_httpd "$1" "${@:3}" ;;
        stop) end_httpd "$1" TERM ;;
        kill) end_httpd "$1" KILL ;;
        status)
            httpd_runs "$1" || die "vorn-httpd is not running in $1"
            say "ok: vorn-httpd is running in $1: $(httpd_url "$1")"
            ;;
        log)
            ! [[ -e $STATE/$1.httpd.log ]] || cat -- "$STATE/$1.httpd.log"
            inside "$1" grep -a ' vorn-httpd\[[0-9]*\]: ' /var/log/syslog || true
            ;;
        *) wrong_usage "\"httpd\" knows start, stop, kill, status and log, not \"$2\"." ;;
    esac
}

# The record: process, whether it is in the host's own network, and the page's address.
httpd_pid() {
    local pid
    read -r pid _ 2>/dev/null <"$STATE/hosts/$1/httpd" || return 1
    [[ $(inside "$1" readlink "/proc/$pid/exe") == "$HTTPD" ]] && printf '%s' "$pid"
}

httpd_url() {
    local url
    read -r _ _ url <"$STATE/hosts/$1/httpd" && printf '%s' "$url"
}

httpd_runs() {
    httpd_pid "$1" >/dev/null
}

httpd_is_gone() {
    ! httpd_runs "$1"
}

# httpd_answers HOST URL INSIDE: whatever it answers; whether vornd does is not asked here.
httpd_answers() {
    local words=(curl --insecure --silent --output /dev/null --max-time 2 --noproxy '*' "$2healthz")
    if $3; then
        inside "$1" "${words[@]}"
    else
        "${words[@]}"
    fi
}

# It says so once it has its address. An answer alone may be that of another lab's, which took the port a moment before.
httpd_listens() {
    inside "$1" grep -aqs " vorn-httpd\[$DAEMON\]: listens on " /var/log/syslog
}

port_is_free() {
    [[ -z $(ss --no-header --listening --tcp --numeric "sport = :$1") ]]
}

start_httpd() {
    local host=$1 network=false listen=() options=() begin=$EPOCHREALTIME port url scheme=https
    shift
    while (($# > 0)); do
        case $1 in
            --inside) network=true ;;
            --listen)
                [[ ${2:-} =~ ^(([0-9.]+)|(\[[0-9a-fA-F:.]+\])):[1-9][0-9]{0,4}$ ]] ||
                    wrong_usage "--listen takes an address and a port, such as 127.0.0.1:8443."
                listen+=("$2")
                shift
                ;;
            --)
                options=("${@:2}")
                break
                ;;
            *) wrong_usage "\"httpd $host start\" takes no \"$1\"." ;;
        esac
        shift
    done
    inside "$host" test -x "$HTTPD" || die "$host has no vorn-httpd; bring the lab up with --stage FOLDER"
    ! httpd_runs "$host" || die "vorn-httpd is running in $host: $(httpd_url "$host")"
    inside "$host" install -d -m 700 -o "$HTTPD_USER" -g "$HTTPD_USER" "$HTTPD_STATE" ||
        die "$HTTPD_STATE of $host can't be made"
    [[ " ${options[*]} " != *" --clear-text "* ]] || scheme=http
    if ((${#listen[@]} > 0)); then
        run_httpd "$host" "$network" "$scheme" "${listen[@]}" -- "${options[@]}" || cannot_listen "$host"
    elif $network; then
        run_httpd "$host" true "$scheme" "127.0.0.1:$FIRST_PORT" "$(address_of "$host"):$FIRST_PORT" -- "${options[@]}" ||
            cannot_listen "$host"
    else
        # Somebody else may take the port between the look and the start.
        port=$FIRST_PORT
        until port_is_free "$port" && run_httpd "$host" false "$scheme" "127.0.0.1:$port" -- "${options[@]}"; do
            ((++port <= LAST_PORT)) || cannot_listen "$host"
        done
    fi
    url=$(httpd_url "$host")
    say "ok: vorn-httpd answers in $host after $(milliseconds_since "$begin") ms: $url"
}

cannot_listen() {
    die_with "$STATE/$1.httpd.log" "vorn-httpd in $1 can't have its address"
}

# run_httpd HOST INSIDE SCHEME ADDRESS:PORT... -- OPTION...: 1 when the address is another's. The process belongs to the
# host, so that it ends with it, but for its network: without INSIDE that is the machine's, where browsers are.
run_httpd() {
    local host=$1 network=$2 scheme=$3 log=$STATE/$1.httpd.log listen=() url
    shift 3
    url=$scheme://$1/
    url=${url/\/\/0.0.0.0:/\/\/127.0.0.1:}
    url=${url/\/\/\[::\]:/\/\/[::1]:}
    while [[ $1 != -- ]]; do
        listen+=(--listen "$1")
        shift
    done
    shift
    : >"$log"
    ENTER_WITHOUT_NETWORK=$($network || printf yes) start_daemon "$host" "$log" \
        setpriv "--reuid=$HTTPD_USER" "--regid=$HTTPD_USER" --clear-groups --no-new-privs --inh-caps=-all \
        --ambient-caps=-all --bounding-set=-all -- env "HOME=$HTTPD_STATE" "$HTTPD" "${listen[@]}" "$@"
    printf '%s %s %s\n' "$DAEMON" "$network" "$url" >"$STATE/hosts/$host/httpd"
    daemon_answers "$HTTPD_SECONDS" httpd_listens "$host" &&
        daemon_answers "$HTTPD_SECONDS" httpd_answers "$host" "$url" "$network" && httpd_runs "$host" && return
    if httpd_runs "$host"; then
        end_httpd "$host" KILL >/dev/null
        die_with "$log" "vorn-httpd in $host does not answer"
    fi
    rm -f -- "$STATE/hosts/$host/httpd"
    grep -qi 'address already in use' "$log" && return 1
    die_with "$log" "vorn-httpd in $host has ended"
}

end_httpd() {
    local pid
    pid=$(httpd_pid "$1") || die "vorn-httpd is not running in $1"
    inside "$1" kill "-$2" "$pid" || true
    until_true "$HTTPD_SECONDS" httpd_is_gone "$1" || die "vorn-httpd in $1 did not end within $HTTPD_SECONDS s"
    rm -f -- "$STATE/hosts/$1/httpd"
    say "ok: vorn-httpd in $1 has ended"
}
