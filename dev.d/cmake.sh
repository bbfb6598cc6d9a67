# Configuring, building and testing a preset.
# shellcheck shell=bash

PRESETS=(dev asan-ubsan tsan coverage fuzz release powerpc powerpc-debug powerpc-sanitize)

is_preset() {
    local preset
    for preset in "${PRESETS[@]}"; do
        [[ $preset != "$1" ]] || return 0
    done
    return 1
}

# The sanitizers of Debian 12's compilers need an address space that is not spread too widely; where the kernel spreads
# it wider, their programs die at random. Some containers forbid the change; then it has to do without.
plain_addresses() {
    if setarch "$(uname -m)" -R true 2>/dev/null; then
        setarch "$(uname -m)" -R "$@"
    else
        "$@"
    fi
}

# A build folder that came along with a copied tree belongs to another place, and CMake would refuse it.
drop_foreign_build() {
    local cache=$1/CMakeCache.txt home
    if [[ -f $cache ]]; then
        home=$(sed -n 's/^CMAKE_HOME_DIRECTORY:INTERNAL=//p' "$cache")
        if [[ $home != "$ROOT" ]]; then
            say "  ${1#"$ROOT"/} was built for $home; starting it anew"
            rm -rf -- "$1"
        fi
    fi
}

# configure PRESET [CMAKE ARGUMENT...]
configure() {
    drop_foreign_build "$ROOT/build/$1"
    step --title "\$ cmake --preset $*" cmake --preset "$@"
}

# build PRESET [TARGET...]
build() {
    local preset=$1
    shift
    step --title "\$ cmake --build --preset $preset${*:+ --target $*}" \
        plain_addresses cmake --build --preset "$preset" --parallel "$(cores)" ${1:+--target "$@"}
}

# The module as clang compiles it; clang-tidy needs the commands of this build too.
configure_clang() {
    drop_foreign_build "$ROOT/build/clang"
    step --title "\$ cmake --preset dev -B build/clang -D CMAKE_CXX_COMPILER=clang++" \
        cmake --preset dev -B build/clang -D CMAKE_CXX_COMPILER=clang++ -D BUILD_TESTING=OFF
}

# run_ctest FOLDER NAME [CTEST ARGUMENT...]: sets TESTS and FAILED, and answers 0 when all passed. A test that was
# skipped or disabled counts as failed: it proves nothing.
run_ctest() {
    local folder=$1 name=$2 results passed=0 result=0 entry
    shift 2
    results=$LOGS/$name.xml
    rm -f -- "$results"
    TESTS=0
    FAILED=0
    printf '  %-62s' "\$ ctest --test-dir $folder $*"
    local begin=$EPOCHREALTIME
    printf '\n$ ctest --test-dir %s %s\n' "$folder" "$*" >>"$LOG"
    plain_addresses ctest --test-dir "$folder" --parallel "${TEST_JOBS:-$(cores)}" --timeout "${TEST_TIMEOUT:-300}" --no-tests=error \
        --test-output-size-passed 65536 --output-on-failure --output-junit "$results" "$@" >>"$LOG" 2>&1 </dev/null || result=$?
    printf ' %8s s\n' "$(seconds_since "$begin")"
    if [[ -f $results ]]; then
        TESTS=$(grep -c '<testcase ' "$results" || true)
        passed=$(grep -c '<testcase .*status="run"' "$results" || true)
    fi
    FAILED=$((TESTS - passed))
    if ((TESTS == 0)); then
        say "  no tests: nothing was found to run. All output is in ${LOG#"$ROOT"/}"
        return 1
    fi
    if ((FAILED > 0)); then
        while IFS= read -r entry; do
            say "  failed: $entry"
        done < <(sed -n '/<testcase /{/status="run"/d;s/.*<testcase name="\([^"]*\)".*/\1/p}' "$results" | head -n 50)
        say "  their output is in ${LOG#"$ROOT"/}; the end of it:"
        tail -n 40 "$LOG" | sed 's/^/    | /'
        return 1
    fi
    return "$result"
}
