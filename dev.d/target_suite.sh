# The suite "target": the module built and tested for a 32-bit big-endian machine, run under qemu.
# shellcheck shell=bash disable=SC2153 # variables shared with the files that this one stands beside

# shellcheck source=dev.d/target.sh
. "$ROOT/dev.d/target.sh"

test_target() {
    TARGET_TESTS=0 TARGET_FAILED=0
    build_target_prefix
    # The sweep, the unit tests and the fuzzers' inputs, with both sanitizers.
    test_on_target powerpc-sanitize build/powerpc-sanitize || true
    # The same without them: what they move about in memory lies elsewhere. One sweep is enough.
    test_on_target powerpc-debug build/powerpc-debug --label-exclude '^sweep$' || true
    # What is shipped.
    test_on_target powerpc build/powerpc/tests/library || true
    count "$TARGET_TESTS" "$TARGET_FAILED"
    ((TARGET_FAILED == 0))
}

# test_on_target PRESET FOLDER [CTEST ARGUMENT...]: a preset that can't be built counts as a test that failed.
test_on_target() {
    local result=0 cases=0
    if ! { configure "$1" && build "$1"; }; then
        TARGET_TESTS=$((TARGET_TESTS + 1)) TARGET_FAILED=$((TARGET_FAILED + 1))
        return 1
    fi
    TEST_TIMEOUT=900 run_ctest "$2" "target-$1" "${@:3}" || result=$?
    cases=$(test_cases "$LOGS/target-$1.xml")
    say "    $cases tests in $TESTS runs under qemu, $FAILED runs failed"
    TARGET_TESTS=$((TARGET_TESTS + cases))
    TARGET_FAILED=$((TARGET_FAILED + (result != 0 && FAILED == 0 ? 1 : FAILED)))
    return "$result"
}

# test_cases RESULTS: how many tests ran, when a run may hold many of GoogleTest's, which it tells itself.
test_cases() {
    awk '
        /<testcase / { runs++ }
        match($0, /\[==========\] [0-9]+ tests? from [0-9]+ test suites? ran/) {
            split(substr($0, RSTART), word, " ")
            cases += word[2] - 1
        }
        END { print runs + cases }' "$1"
}
