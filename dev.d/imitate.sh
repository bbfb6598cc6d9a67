# ./dev imitate: the built library at work on an imitated appliance.
# shellcheck shell=bash

for file in packages cmake; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev imitate

Builds the library that is shipped and a small host, loads the library as the appliance's server does, and calls all of
its operations through its API table. Each request, its answer and the time it took are shown. The appliance around it
is imitated: nothing outside the program is read, changed or run.
TEXT
}

main() {
    case ${1:-} in
        -h | --help)
            usage
            return
            ;;
        '') ;;
        *) wrong_usage "\"imitate\" takes no \"$1\"." ;;
    esac
    start_log
    need_packages "${RELEASE_PACKAGES[@]}"
    configure release || die "CMake could not configure the release"
    build release vorn_directory_domain library_host || die "the library and its host could not be built"
    printf '\nThe appliance is IMITATED: no domain, no network and no file of this machine is touched.\n'
    printf 'The library is the real one, as it is shipped.\n\n'
    build/release/tests/library/library_host build/release/src/vorn_directory_domain.so ||
        die "the library did not answer as expected; see above"
    say "ok: the library works in a host with an imitated appliance"
}
