# ./dev mutate: do the tests notice small changes of the sources?
# shellcheck shell=bash

# shellcheck source=dev.d/packages.sh
. "$ROOT/dev.d/packages.sh"

RUNNER=tests/mutation/mutate.py

usage() {
    cat <<'TEXT'
usage: ./dev mutate [ARGUMENT...]

Changes the sources under src/ in small ways, one at a time, and runs the tests on each. A change that no test notices
is shown: it is a gap in the tests. Arguments go to tests/mutation/mutate.py:

TEXT
    "$RUNNER" --help 2>/dev/null | sed 's/^/  /' || true
}

main() {
    local result=0
    case ${1:-} in
        -h | --help)
            usage
            return
            ;;
    esac
    start_log
    [[ -x $RUNNER ]] || die "$RUNNER is missing"
    need_packages "${MUTATE_PACKAGES[@]}"
    "$RUNNER" "$@" || result=$?
    ((result == 0)) || die "the tests do not notice every change, or the run broke off (code $result); see above"
    say "ok: the mutation run has no complaint"
}
