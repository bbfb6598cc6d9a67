# ./dev run: an appliance that joins a real domain, and all that it does then.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

for file in packages cmake stage run_steps; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

LAB=$ROOT/lab/lab

usage() {
    cat <<'TEXT'
usage: ./dev run [--once | --unjoined]

Makes this machine into a storage appliance, without changing it: installs the packages that are missing, builds, brings
up two domains of Active Directory that trust each other and an appliance beside them, and does the main job there, step
by step: join, test, list, refresh, options, schedule. Each step is shown with its answer and the time it took. Then all
of it stays up, with hints what to try, until Ctrl-C takes it down. The administrator's page is to be seen with a browser
of this machine; its address and a link that logs in come last.

  --once       leave the domain after the last step, take everything down and end
  --unjoined   stop before the join, so that the rest can be done by hand

Domains and appliance live in namespaces of their own: they see a private copy of this machine's files, and nothing that
they write or send leaves them, but for the page, which listens on 127.0.0.1. Needs root, and the right to make namespaces (in a container: a privileged one).
TEXT
}

main() {
    local once=false unjoined=false
    while (($# > 0)); do
        case $1 in
            -h | --help)
                usage
                return
                ;;
            --once) once=true ;;
            --unjoined) unjoined=true ;;
            *) wrong_usage "\"run\" takes no \"$1\"." ;;
        esac
        shift
    done
    check_rights
    start_log
    ! "$LAB" status >/dev/null 2>&1 ||
        die "a lab is up already; \"./dev lab down\" takes it down. LAB_DIR names another folder for a second one"
    need_packages "${BUILD_PACKAGES[@]}" "${LAB_PACKAGES[@]}"
    printf '\nBuilding the appliance\n'
    build_stage
    trap end_run EXIT
    trap interrupted INT TERM HUP
    bring_up
    show_unjoined
    show_page
    if $unjoined; then
        $once || stay_up hints_to_join
        return
    fi
    show_main_job
    if $once; then
        show_leave
        "$LAB" down || die "the lab could not be taken down"
        trap - EXIT
        say "ok: joined, did the main job, and left"
    else
        stay_up hints
    fi
}

bring_up() {
    printf '\nBringing up the domains and the appliance nas1\n'
    "$LAB" up --only-new --with-pid $$ --trust --appliances nas1 --stage "$STAGE" | sed -u 's/^/  /' ||
        die "the lab could not be brought up"
    "$LAB" vornd nas1 start | sed -u 's/^/  /' || die "the appliance's server did not start"
    "$LAB" httpd nas1 start | sed -u 's/^/  /' || die "the administrator's page is not served"
}

# However this command ends, nothing stays up.
end_run() {
    local result=$?
    trap - EXIT
    trap '' INT TERM HUP
    "$LAB" down || result=1
    exit "$result"
}

# Until Ctrl-C, which is the right end then.
stay_up() {
    local result=0
    "$1"
    # shellcheck disable=SC2064 # now
    trap "printf '\n'; exit 0" INT TERM HUP
    while "$LAB" status >/dev/null 2>&1; do
        sleep 1 &
        wait "$!" || result=$?
    done
    die "the lab is gone: something else has taken it down"
}
