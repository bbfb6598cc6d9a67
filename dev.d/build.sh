# ./dev build: configures and builds a preset.
# shellcheck shell=bash

for file in packages cmake target; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev build [PRESET] [TARGET...]

Builds everything, or the targets, of a preset into build/PRESET. The presets are those of CMakePresets.json:

  dev          debug build for daily work; this one unless another is named
  asan-ubsan   with address, leak and undefined-behaviour sanitizers
  tsan         with the thread sanitizer
  coverage     with counters of lines and branches
  fuzz         the fuzzers, by clang
  release      what is shipped: build/release/src/vorn_directory_domain.so

and for a 32-bit big-endian target

  powerpc           what is shipped: build/powerpc/src/vorn_directory_domain.so
  powerpc-debug     debug build
  powerpc-sanitize  with address and undefined-behaviour sanitizers
TEXT
}

main() {
    local preset=dev packages
    case ${1:-} in
        -h | --help)
            usage
            return
            ;;
        -*) wrong_usage "There is no option \"$1\"." ;;
        '') ;;
        *)
            is_preset "$1" || wrong_usage "There is no preset \"$1\"."
            preset=$1
            shift
            ;;
    esac
    start_log
    mapfile -t packages < <(packages_of_preset "$preset")
    need_packages "${packages[@]}"
    [[ $preset != powerpc* ]] || build_target_prefix
    configure "$preset" || die "CMake could not configure the preset $preset"
    build "$preset" "$@" || die "the preset $preset could not be built; the first error is above"
    say "ok: built in build/$preset"
}
