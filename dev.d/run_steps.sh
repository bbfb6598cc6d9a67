# The steps that "./dev run" shows, and its hints.
# shellcheck shell=bash disable=SC2153 # LAB and LOG are of the files that read this one

STEP_SECONDS=180
JOINED_DOMAIN=lab.test
CONTROLLER=10.77.0.10
API=VORN.Core.Directory.Domain
CURL=(curl --silent --show-error --unix-socket /run/vorn/vornd.sock --header 'Content-Type: application/json')
# The page's certificate is its own.
PAGE_CURL=(curl --insecure --silent --show-error --fail --max-time 10 --noproxy '*')

title() {
    printf '\n%s\n' "$1"
}

# show EXPECTED COMMAND...: runs it in the appliance and shows it with its answer, which holds the expected text when it
# is the right one. The input goes to the command. Ends everything when the step fails.
show() {
    local place=("$LAB" exec nas1)
    show_answer "$@"
}

# The same on this machine.
show_here() {
    local place=()
    show_answer "$@"
}

show_answer() {
    local expected=$1 begin result=0 answer
    shift
    printf '  $ %s\n' "$(shown "$@")"
    begin=$EPOCHREALTIME
    answer=$(timeout --foreground "$STEP_SECONDS" "${place[@]}" "$@" 2>&1) || result=$?
    printf '%s\n' "$answer" | sed 's/^/    /'
    printf '    (%s s)\n' "$(seconds_since "$begin")"
    { printf '\n$ %s\n' "$(shown "$@")" && printf '%s\n(code %d)\n' "$answer" "$result"; } >>"$LOG"
    ((result != 124)) || die "there was no answer within $STEP_SECONDS s. \"./dev lab vornd nas1 log\" may tell why"
    ((result == 0)) || die "this step failed with code $result"
    [[ $answer == *"$expected"* ]] || die "this is not the answer that was expected; it lacks \"$expected\""
}

# The command as it could be typed.
shown() {
    local word text=""
    for word in "$@"; do
        [[ $word != *[!A-Za-z0-9_.,:/=@%+-]* && -n $word ]] || word="'$word'"
        text+=" $word"
    done
    printf '%s' "${text# }"
}

administrator_password() {
    "$LAB" users | awk '$1 == "LAB" && $2 == "Administrator" { print $3 }'
}

show_unjoined() {
    title "Status: not a member of any domain yet"
    show 'enable_domain":false' vornctl --json status </dev/null
    show '' vornctl status </dev/null
}

page_address() {
    "$LAB" httpd nas1 status | sed -n 's|.* \(https://.*\)/$|\1|p'
}

show_page() {
    local address
    address=$(page_address)
    [[ -n $address ]] || die "the administrator's page has no address"
    title "The administrator's page, from this machine"
    show_here '"status":"ok"' "${PAGE_CURL[@]}" "$address/healthz" </dev/null
    show_here '</html>' "${PAGE_CURL[@]}" "$address/" </dev/null
}

show_main_job() {
    title "Join $JOINED_DOMAIN (the password comes on the input)"
    show '' vornctl join "$JOINED_DOMAIN" --user Administrator --password-stdin --dns "$CONTROLLER" \
        < <(administrator_password)
    show '' vornctl steps </dev/null
    title "Status, from the command line and from the web API"
    show 'LAB' vornctl status </dev/null
    show '"enable_domain":true' "${CURL[@]}" "http://localhost/webapi/$API/1/get" --data '{}' </dev/null
    title "Test the membership"
    show '' vornctl test </dev/null
    show '"test_join_success":true' "${CURL[@]}" "http://localhost/webapi/$API/1/test_dc" --data '{}' </dev/null
    title "Domains: version 1, the names; version 2, with DNS names"
    show 'OTHER' vornctl list --v1 </dev/null
    show 'other.test' vornctl list </dev/null
    show '"LAB"' "${CURL[@]}" "http://localhost/webapi/$API/2/get_domain_list" --data '{}' </dev/null
    title "Refresh the users and groups of all domains"
    show '' vornctl refresh </dev/null
    show 'alice' vornctl users --limit 20 </dev/null
    show 'nasusers' vornctl groups --limit 20 --search nasusers </dev/null
    show 'zed' vornctl users --domain OTHER </dev/null
    title "Options of the file-sharing service"
    show '' vornctl options </dev/null
    show '' vornctl call "$API.Conf" 1 set '{"enable_server_signing": true, "domain_nested_group": 3}' </dev/null
    show 'if_required' testparm -s --parameter-name='server signing' /usr/vorn/etc/smb.conf </dev/null
    show '' vornctl options </dev/null
    title "A schedule of the refresh"
    show '' vornctl schedule --weekly sun,wed --at 03:30 </dev/null
    show '' vornctl schedule </dev/null
    show 'root' cat /etc/cron.d/vorn </dev/null
    title "Status"
    show 'LAB' vornctl status </dev/null
}

show_leave() {
    title "Leave the domain"
    show '' vornctl leave --yes </dev/null
    show 'enable_domain":false' vornctl --json status </dev/null
    printf '\n'
}

# The last words: how to log in to the page. The link comes fresh.
say_page() {
    local address link
    address=$(page_address)
    link=$("$LAB" exec nas1 vornctl link --address "$address" </dev/null 2>>"$LOG" | sed -n 's/^Link *//p') || true
    [[ $link == https://*/#/link/?* ]] || die "the appliance gives no link that logs in to its page"
    cat <<TEXT
The administrator's page, for a browser of this machine. Its certificate is its own, so the browser asks whether to go on.

  $address/
  account admin, password $(local_password admin)

  logs in once, within 10 minutes:  $link
TEXT
    printf '\n'
}

local_password() {
    "$LAB" users | awk -v name="$1" '$1 == "(nas)" && $2 == name { print $3 }'
}

# Commands in another terminal find the lab by its folder.
say_folder() {
    [[ -z ${LAB_DIR:-} ]] || printf '\nIn another terminal, first of all:  export LAB_DIR=%q\n' "$LAB_DIR"
}

hints() {
    say_folder
    cat <<'TEXT'

All of it stays up until Ctrl-C. In another terminal, for example:

  ./dev lab exec nas1 vornctl --help
  ./dev lab exec nas1 vornctl users --search a
  ./dev lab exec nas1 vornctl events
  ./dev lab fault dead dc1                     the controller no longer answers; what does "vornctl test" say?
  ./dev lab fault none
  ./dev lab exec nas1 vornctl leave
  ./dev lab shell nas1
  ./dev lab vornd nas1 log
  ./dev lab status

TEXT
    "$LAB" users | sed 's/^/  /'
    printf '\n'
    say_page
    say "ok: the appliance nas1 is a member of LAB; Ctrl-C takes everything down"
}

hints_to_join() {
    say_folder
    cat <<TEXT

All of it stays up until Ctrl-C. In another terminal, for example:

  ./dev lab exec nas1 vornctl join $JOINED_DOMAIN --user Administrator --dns $CONTROLLER
  ./dev lab exec nas1 vornctl status
  ./dev lab exec nas1 vornctl --help
  ./dev lab shell nas1

TEXT
    "$LAB" users | sed 's/^/  /'
    printf '\n'
    say_page
    say "ok: the appliance nas1 is up and no member yet; Ctrl-C takes everything down"
}
