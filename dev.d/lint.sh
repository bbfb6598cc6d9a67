# ./dev lint: clang-tidy.
# shellcheck shell=bash disable=SC2034 # variables shared with suites.sh

for file in packages sources cmake suites; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev lint [FILE...]

Examines the sources under src/ and appliance/, or the files, with clang-tidy and the rules of .clang-tidy.
TEXT
}

main() {
    local file
    for file in "$@"; do
        case $file in
            -h | --help)
                usage
                return
                ;;
            -*) wrong_usage "There is no option \"$file\"." ;;
        esac
        [[ -f $file && $file == *.cpp ]] || wrong_usage "\"$file\" is no C++ source of the project."
    done
    SUITE=lint
    RESULT=$LOGS/lint.result
    start_log
    need_packages "${LINT_PACKAGES[@]}"
    if (($# == 0)); then
        suite_lint || die "clang-tidy has objections; see above"
    else
        configure_clang || die "CMake could not configure a build with clang"
        printf '%s\n' "$@" | check_files clang-tidy -p build/clang --quiet || die "clang-tidy has objections; see above"
    fi
    say "ok: clang-tidy has no objections"
}
