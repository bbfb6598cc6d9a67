# ./dev test: all suites, or those named.
# shellcheck shell=bash

for file in packages sources cmake suites; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev test [--quick] [--deadline SECONDS] [SUITE...]
       ./dev test --target powerpc [--deadline SECONDS]

Installs what is missing, builds, and runs the suites. At the end come a table and a line "N passed, N failed", which
counts test cases and checked files. The exit code is 1 when anything failed, also when a suite found no tests.

  --quick              only the suites marked with *
  --target powerpc     only the suite "target", which is for that machine
  --deadline SECONDS   end a suite that takes longer; each has a deadline of its own otherwise

Suites, all of them unless some are named:
TEXT
    local suite
    for suite in "${SUITES[@]}"; do
        printf '  %-10s %s %s\n' "$suite" "$([[ " ${QUICK_SUITES[*]} " == *" $suite "* ]] && printf '*' || printf ' ')" \
            "$(about_suite "$suite")"
    done
    printf '\nLogs and results are in build/logs.\n'
}

main() {
    local chosen=() deadline="" quick=false target=false suite
    while (($# > 0)); do
        case $1 in
            -h | --help)
                usage
                return
                ;;
            --quick) quick=true ;;
            --target)
                [[ ${2:-} == powerpc ]] || wrong_usage "--target takes the name of a target: powerpc."
                target=true
                shift
                ;;
            --deadline)
                [[ ${2:-} =~ ^[1-9][0-9]*$ ]] || wrong_usage "--deadline takes a number of seconds."
                deadline=$2
                shift
                ;;
            -*) wrong_usage "There is no option \"$1\"." ;;
            *)
                [[ " ${SUITES[*]} " == *" $1 "* ]] || wrong_usage "There is no suite \"$1\"."
                [[ " ${chosen[*]} " == *" $1 "* ]] || chosen+=("$1")
                ;;
        esac
        shift
    done
    if $quick && ((${#chosen[@]} > 0)); then
        wrong_usage "Either --quick or names of suites."
    fi
    if $target; then
        if $quick || ((${#chosen[@]} > 0)); then
            wrong_usage "--target goes with --deadline only."
        fi
        chosen=(target)
    fi
    if ((${#chosen[@]} == 0)); then
        chosen=("${SUITES[@]}")
        ! $quick || chosen=("${QUICK_SUITES[@]}")
    fi
    start_log
    run_suites "$deadline" "${chosen[@]}"
}

run_suites() {
    local deadline=$1 packages suite
    shift
    rm -f -- "$LOGS"/*.result "$LOGS/summary.txt"
    mapfile -t packages < <(for suite in "$@"; do packages_of_suite "$suite"; done | sort -u)
    need_packages "${packages[@]}"
    for suite in "$@"; do
        run_suite "$suite" "${deadline:-$(deadline_of_suite "$suite")}"
    done
    show_table "$@"
}

# The suite is a group of processes of its own, and "timeout" passes on what ends it.
run_suite() {
    local suite=$1 deadline=$2 begin=$EPOCHREALTIME result=0 tests=0 failed=0 note=""
    printf '\n%s: %s\n' "$suite" "$(about_suite "$suite")"
    supervise TERM timeout --kill-after=20 "$deadline" bash "$ROOT/dev.d/suite.sh" "$suite" || result=$?
    if [[ -f $LOGS/$suite.result ]]; then
        read -r tests failed <"$LOGS/$suite.result"
    fi
    if ((result == 124 || result == 137)); then
        note="ended after its deadline of $deadline s"
    elif ((tests == 0)); then
        note="no tests"
        ((result == 0)) || [[ -f $LOGS/$suite.result ]] || note="could not be built or started"
    elif ((result != 0 && failed == 0)); then
        note="ended with code $result"
    fi
    [[ -z $note ]] || failed=$((failed + 1))
    printf '%s %d %d %s %s\n' "$suite" "$tests" "$failed" "$(seconds_since "$begin")" "$note" >>"$LOGS/summary.txt"
    if ((failed == 0)); then
        say "  ok: $tests passed"
    else
        say "  FAILED: $failed${note:+ ($note)}. All output: build/logs/$suite.log"
    fi
}

show_table() {
    local suite tests failed seconds note passed_sum=0 failed_sum=0 left_out=()
    printf '\n%-10s %8s %8s %9s\n' suite tests failed seconds
    while read -r suite tests failed seconds note; do
        printf '%-10s %8d %8d %9s%s\n' "$suite" "$tests" "$failed" "$seconds" "${note:+  $note}"
        passed_sum=$((passed_sum + (tests > failed ? tests - failed : 0)))
        failed_sum=$((failed_sum + failed))
    done <"$LOGS/summary.txt"
    for suite in "${SUITES[@]}"; do
        [[ " $* " == *" $suite "* ]] || left_out+=("$suite")
    done
    ((${#left_out[@]} == 0)) || printf 'not run, as asked: %s\n' "${left_out[*]}"
    printf '\n%d passed, %d failed\n' "$passed_sum" "$failed_sum"
    ((failed_sum == 0))
}
