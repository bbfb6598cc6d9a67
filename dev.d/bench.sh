# ./dev bench: times and sizes of the release, alone and as an appliance in real domains.
# shellcheck shell=bash

for file in packages cmake stage target; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

MODULE_BENCH=bench/run
APPLIANCE_BENCH=bench/appliance/run
TARGET_BENCH=bench/target

usage() {
    cat <<'TEXT'
usage: ./dev bench
       ./dev bench module [ARGUMENT...]
       ./dev bench appliance [ARGUMENT...]
       ./dev bench target

Builds the release, measures it and holds the figures against the wanted ones. Without a name the first two are measured.

  module     the module alone, on a platform that costs nothing: times, allocations, instructions
  appliance  the appliance in real domains, which are brought up for it: joins, status, refreshes of 20,000 users,
             memory, a dead controller; beside Samba's own tools. Needs root, and the right to make namespaces
  target     the module on a 32-bit big-endian machine beside this one, under qemu: instructions, heap, size

Arguments of "module":

TEXT
    "$MODULE_BENCH" --help 2>/dev/null | sed 's/^/  /' || true
    printf '\nArguments of "appliance":\n\n'
    "$APPLIANCE_BENCH" --help 2>/dev/null | sed 's/^/  /' || true
}

main() {
    case ${1:-} in
        -h | --help) usage ;;
        '') measure_both ;;
        module | appliance | target)
            [[ ${2:-} != @(-h|--help) ]] || { usage && return; }
            "measure_$1" "${@:2}"
            ;;
        *) wrong_usage "\"bench\" measures \"module\", \"appliance\" or \"target\", not \"$1\"." ;;
    esac
}

measure_module() {
    start_log
    need_packages "${RELEASE_PACKAGES[@]}"
    bench_module "$@" || die "a wanted figure of the module is missed by far; see the table"
    say "ok: measured; no wanted figure of the module is missed by far"
}

measure_appliance() {
    check_rights
    start_log
    need_packages "${APPLIANCE_BENCH_PACKAGES[@]}"
    bench_appliance "$@" || die "a wanted figure of the appliance is missed by far; see the table"
    say "ok: measured; no wanted figure of the appliance is missed by far"
}

measure_target() {
    (($# == 0)) || wrong_usage "\"bench target\" takes no \"$1\"."
    start_log
    need_packages "${RELEASE_PACKAGES[@]}" "${TARGET_PACKAGES[@]}"
    build_target_prefix
    local preset
    for preset in release powerpc; do
        { configure "$preset" && build "$preset"; } || die "the preset $preset could not be built"
    done
    judge "$TARGET_BENCH" || die "the target's library is larger than wanted; see above"
    say "ok: measured"
}

measure_both() {
    local result=0
    check_rights
    start_log
    need_packages "${APPLIANCE_BENCH_PACKAGES[@]}"
    bench_module || result=1
    bench_appliance || result=1
    ((result == 0)) || die "a wanted figure is missed by far; see the tables"
    say "ok: module and appliance measured; no wanted figure is missed by far"
}

# Both answer 1 when a wanted figure is missed by far. Times on a machine that does something else mean little.
bench_module() {
    configure release || die "CMake could not configure the release"
    build release || die "the release could not be built"
    judge "$MODULE_BENCH" "$@"
}

bench_appliance() {
    configure release || die "CMake could not configure the release"
    build release nothing_module load || die "the module that does nothing and the load could not be built"
    build_stage
    judge "$APPLIANCE_BENCH" "$@"
}

judge() {
    local result=0
    supervise TERM "$@" || result=$?
    ((result <= 1)) || die "the measurement could not be made (code $result)"
    return "$result"
}
