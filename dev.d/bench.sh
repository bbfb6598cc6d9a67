# ./dev bench: times and sizes of the release.
# shellcheck shell=bash

for file in packages cmake; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev bench [ARGUMENT...]

Builds the release and runs bench/run on it, which shows times, allocations and instructions and holds them against the
wanted figures. Arguments go to bench/run:

TEXT
    bench/run --help 2>/dev/null | sed 's/^/  /' || true
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
    [[ -x bench/run ]] || die "bench/run is missing"
    need_packages "${RELEASE_PACKAGES[@]}"
    configure release || die "CMake could not configure the release"
    build release || die "the release could not be built"
    bench/run "$@" || result=$?
    case $result in
        0) say "ok: measured; no wanted figure is missed by far" ;;
        1) die "a wanted figure is missed by far; see the table. Measure on a machine that does nothing else" ;;
        *) die "the measurement could not be made (code $result)" ;;
    esac
}
