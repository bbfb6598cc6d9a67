# The suites of "./dev test". Each one runs as a process of its own (suite.sh) and leaves its counts with "count".
# shellcheck shell=bash disable=SC2034,SC2153 # variables shared with the files that read this one

SUITES=(format shell clang lint unit corpus sweep threads coverage library target platform console lab browser package)
QUICK_SUITES=(format shell unit corpus library)

about_suite() {
    case $1 in
        format) say "the C++ sources are formatted as .clang-format says" ;;
        shell) say "shellcheck finds nothing in the scripts" ;;
        clang) say "clang compiles the module without a warning" ;;
        lint) say "clang-tidy finds nothing in src/ and appliance/" ;;
        unit) say "unit tests, with address and undefined-behaviour sanitizers" ;;
        corpus) say "the fuzzers' inputs as ordinary tests, with the same sanitizers" ;;
        sweep) say "every call of the appliance fails in every way, alone and in pairs, with the same sanitizers" ;;
        threads) say "requests on several threads, with the thread sanitizer" ;;
        coverage) say "the unit tests reach every line and every branch of src/" ;;
        library) say "the built library: symbols, linking, loading, all operations in a host" ;;
        target) say "the module for a 32-bit big-endian machine, under qemu: tests, sweep, inputs, the built library" ;;
        lab) say "the appliance in real domains: joins, tests, lists, refreshes, faults, kills" ;;
        console) say "the page's own tests, its types, eslint and prettier" ;;
        package) say "what others install: made twice, looked at, installed and removed on machines of its own" ;;
        browser) say "the page in Chromium: every view and state imitated, the whole life in a real domain, axe-core" ;;
        platform) say "the appliance on Debian without a domain, with address and undefined-behaviour sanitizers" ;;
    esac
}

# Long enough for two slow cores, and short enough that nothing hangs for an hour.
deadline_of_suite() {
    case $1 in
        format | shell) say 300 ;;
        clang | corpus | library) say 900 ;;
        lab) say 3600 ;;
        *) say 2400 ;;
    esac
}

packages_of_suite() {
    case $1 in
        format) printf '%s\n' "${FORMAT_PACKAGES[@]}" ;;
        shell) printf '%s\n' "${SHELL_PACKAGES[@]}" ;;
        clang) printf '%s\n' "${CLANG_PACKAGES[@]}" ;;
        lint) printf '%s\n' "${LINT_PACKAGES[@]}" ;;
        platform) printf '%s\n' "${PLATFORM_PACKAGES[@]}" ;;
        lab) printf '%s\n' "${E2E_PACKAGES[@]}" ;;
        browser) printf '%s\n' "${BROWSER_PACKAGES[@]}" ;;
        package) printf '%s\n' "${PACKAGE_TEST_PACKAGES[@]}" ;;
        unit | corpus | sweep | threads) printf '%s\n' "${TEST_PACKAGES[@]}" ;;
        coverage) printf '%s\n' "${COVERAGE_PACKAGES[@]}" ;;
        library) printf '%s\n' "${RELEASE_PACKAGES[@]}" ;;
        target) printf '%s\n' "${TARGET_PACKAGES[@]}" ;;
    esac
}

# count TESTS FAILED: what the suite leaves behind for the table.
count() {
    printf '%d %d\n' "$1" "$2" >"$RESULT"
}

# Runs one check for each file named on the input, on all cores; each is a test. check_files COMMAND...: the file comes
# last.
check_files() {
    local output=$LOGS/$SUITE.files files failed
    mapfile -t files
    rm -rf -- "$output"
    mkdir -p "$output"
    # shellcheck disable=SC2016 # expanded by the inner shell
    printf '%s\0' "${files[@]}" | xargs -0 -P "$(cores)" -I '{}' bash -c '
        output=$1/${2//\//_}
        file=$2
        shift 2
        "$@" "$file" >"$output" 2>&1 </dev/null || printf "%s\n" "$file" >>"$output.failed"
    ' check "$output" '{}' "$@"
    failed=$(find "$output" -name '*.failed' | wc -l)
    say "  ${#files[@]} files, $failed failed"
    find "$output" -name '*.failed' | sort | while IFS= read -r name; do
        say "  failed: $(cat "$name")"
        { printf '\n%s\n' "$(cat "$name")" && cat "${name%.failed}"; } >>"$LOG"
        # One bad file in front of many others should not hide them.
        head -n 30 "${name%.failed}" | sed 's/^/    | /'
    done
    count "${#files[@]}" "$failed"
    ((${#files[@]} > 0 && failed == 0))
}

suite_format() {
    cpp_files | check_files clang-format --dry-run -Werror
}

suite_shell() {
    shell_scripts | check_files shellcheck -x
}

suite_clang() {
    configure_clang || return 1
    # A library that is up to date would prove nothing about warnings.
    if step --title "\$ cmake --build build/clang --clean-first --target vorn_directory_domain" \
        cmake --build build/clang --clean-first --parallel "$(cores)" --target vorn_directory_domain; then
        count "$(grep -c '^\[.*Building CXX object' "$LOG")" 0
    else
        count 1 1
        return 1
    fi
}

suite_lint() {
    configure_clang || return 1
    cpp_files | grep -E '^(src|appliance)/.*\.cpp$' | check_files clang-tidy -p build/clang --quiet
}

# Everything that has a suite of its own is left out here, so that nothing is counted twice.
suite_unit() {
    configure asan-ubsan && build asan-ubsan || return 1
    run_ctest_and_count build/asan-ubsan --label-exclude '^(sweep|corpus|platform)$'
}

# Most of these tests wait for something: two for each core.
suite_platform() {
    configure asan-ubsan && build asan-ubsan || return 1
    TEST_JOBS=$(($(cores) * 2)) run_ctest_and_count build/asan-ubsan --label-regex '^platform$'
}

suite_corpus() {
    configure asan-ubsan && build asan-ubsan || return 1
    run_ctest_and_count build/asan-ubsan --label-regex '^corpus$'
}

suite_sweep() {
    configure asan-ubsan && build asan-ubsan || return 1
    TEST_TIMEOUT=2000 run_ctest_and_count build/asan-ubsan --label-regex '^sweep$' || return 1
    sweep_totals "$LOGS/sweep.xml"
}

# The sum of what the operations' sweeps say of themselves.
sweep_totals() {
    grep -aEo 'scenarios [0-9]+, calls [0-9]+, runs [0-9]+, edges [0-9]+ of [0-9]+' "$1" | tr -d , | awk '
        { scenarios += $2; calls += $4; runs += $6; reached += $8; edges += $10 }
        END {
            if (runs == 0) { print "  the tests did not tell what they swept"; exit 1 }
            printf "  scenarios %d, calls %d, runs %d, edges %d of %d\n", scenarios, calls, runs, reached, edges
        }'
}

suite_threads() {
    # The other tests have one thread each, so building them would only cost time.
    configure tsan && build tsan thread_tests || return 1
    run_ctest_and_count build/tsan --label-regex '^threads$'
}

run_ctest_and_count() {
    local result=0
    run_ctest "$1" "$SUITE" "${@:2}" || result=$?
    count "$TESTS" "$FAILED"
    return "$result"
}

# The tests are the same as in "unit", so only the two figures count, and the tests when they fail here.
suite_coverage() {
    local report=build/coverage/report
    configure coverage && build coverage unit_tests thread_tests || return 1
    # Sources that are gone left objects behind, which would count as never reached.
    ninja -C build/coverage -t cleandead >>"$LOG"
    find build/coverage -name '*.gcno' -exec sh -c '[ -f "${1%.gcno}.o" ] || rm -f -- "$1"' drop {} \;
    # Counters of an earlier run would add to those of this one.
    find build/coverage -name '*.gcda' -delete
    if ! run_ctest build/coverage/tests/unit coverage --label-exclude '^threads$'; then
        count "$TESTS" "$((FAILED > 0 ? FAILED : 1))"
        return 1
    fi
    rm -rf -- "$report"
    mkdir -p "$report"
    step --title "\$ gcovr (HTML in $report/index.html)" gcovr --root . --filter 'src/' --exclude-throw-branches \
        --object-directory build/coverage -j "$(cores)" --html-details "$report/index.html" \
        --json "$report/coverage.json" --json-summary "$report/summary.json" --json-summary-pretty build/coverage ||
        return 1
    judge_coverage "$report"
}

# number_in KEY FILE: of the whole project; the figures of the single files are indented further.
number_in() {
    sed -n "s/^    \"$1\": \([0-9]*\),*\$/\1/p" "$2"
}

judge_coverage() {
    local what covered total failed=0
    for what in line branch; do
        covered=$(number_in "${what}_covered" "$1/summary.json")
        total=$(number_in "${what}_total" "$1/summary.json")
        say "  ${covered:-none} of ${total:-unknown} ${what/%ch/che}s reached"
        [[ -n $covered && $covered == "$total" && $total != 0 ]] || failed=$((failed + 1))
    done
    if ((failed > 0)); then
        show_gaps "$1/coverage.json" Lines
        show_gaps "$1/coverage.json" Branches --branches
    fi
    count 2 "$failed"
    ((failed == 0))
}

# show_gaps COVERAGE WHAT [OPTION]: the files with gaps, and the lines of the gaps.
show_gaps() {
    say "  $2 that were not reached (file, how many there are, how many were reached, lines):"
    gcovr --root . --filter 'src/' --exclude-throw-branches --add-tracefile "$1" "${@:3}" 2>>"$LOG" |
        awk '/^src\// { gap = !/ 100% *$/ } /^(-|TOTAL)/ { gap = 0 } gap' | sed 's/^/    | /'
}

suite_library() {
    configure release && build release || return 1
    run_ctest_and_count build/release/tests/library --label-regex '^library$'
}

# "./dev run" comes first, by itself: it stages the programs anew, which the other tests then use. Of those each worker has
# a lab of its own. Two of them, since a lab mostly waits, and the tests know how long things may take.
suite_lab() {
    local result=0 tests=0 failed=0 results more wrong
    build_stage
    rm -f -- "$LOGS"/lab{-run,}.xml
    run_lab_tests "$LOGS/lab-run.xml" tests/dev || result=$?
    run_lab_tests "$LOGS/lab.xml" -n 2 --dist loadfile --stage "$STAGE" tests/e2e || result=$?
    for results in "$LOGS"/lab{-run,}.xml; do
        more=0 wrong=1 # one that leaves no results has failed
        [[ ! -f $results ]] || read -r more wrong < <(sum_of_results "$results")
        tests=$((tests + more)) failed=$((failed + wrong))
    done
    count "$tests" "$failed"
    return "$result"
}

# run_lab_tests RESULTS ARGUMENT...: pytest; the folder comes last.
run_lab_tests() {
    local begin=$EPOCHREALTIME result=0
    say "  \$ pytest ${*: -1}"
    /usr/bin/python3 -m pytest -p no:cacheprovider -v --durations=25 --junitxml "$@" 2>&1 </dev/null |
        tee -a "$LOG" | show_progress || result=$?
    printf '  %-62s %8s s\n' "" "$(seconds_since "$begin")"
    return "$result"
}

# Types and style count as a test each.
suite_console() {
    local check failed=0 tests=0 wrong=0 results=$LOGS/console.xml
    fetch_console_libraries
    for check in typecheck lint; do
        step --title "\$ npm run $check (in console)" npm --prefix "$CONSOLE" run "$check" || failed=$((failed + 1))
    done
    rm -f -- "$results"
    step --title "\$ npm test (in console)" npm --prefix "$CONSOLE" test -- --reporter=default --reporter=junit \
        --outputFile.junit="$results" || wrong=1
    [[ ! -f $results ]] || read -r tests wrong < <(sum_of_vitest "$results")
    count "$((tests + 2))" "$((wrong + failed))"
    ((tests > 0 && wrong + failed == 0))
}

# sum_of_vitest FILE: how many tests ran, and how many of them failed or were skipped.
sum_of_vitest() {
    awk '/<testcase / { tests++ } /<(failure|error|skipped)[ >\/]/ { failed++ } END { print tests + 0, failed + 0 }' "$1"
}

# The page twice: with an appliance that is imitated in the browser, in any state, and with a real one of a lab.
suite_browser() {
    local tests=$ROOT/tests/browser output=$ROOT/build/browser part result=0 begin
    build_stage
    need_console_packages
    if [[ ! -f $tests/node_modules/.package-lock.json || $tests/package-lock.json -nt $tests/node_modules/.package-lock.json ]]; then
        step --title "\$ npm ci (in ${tests#"$ROOT"/})" npm --prefix "$tests" ci --no-audit --no-fund ||
            die "the libraries of the tests could not be fetched. Check the network, then try again"
    fi
    rm -rf --one-file-system -- "$output"
    for part in imitated real; do
        begin=$EPOCHREALTIME
        say "  \$ node tests/browser/run.mjs $part"
        node "$tests/run.mjs" "$part" --stage "$STAGE" --page "$STAGE/usr/vorn/share/console" \
            --httpd "$STAGE/usr/vorn/sbin/vorn-httpd" --output "$output" 2>&1 </dev/null | tee -a "$LOG" |
            grep --line-buffered -Ev '^ok ' | sed -u 's/^/  /' || result=1
        printf '  %-62s %8s s\n' "" "$(seconds_since "$begin")"
        [[ -f $output/$part.xml ]] || result=1
    done
    say "  pictures of all views are in ${output#"$ROOT"/}/screenshots, figures in ${output#"$ROOT"/}/figures.json"
    # shellcheck disable=SC2046 # two numbers
    count $(cat -- "$output"/*.xml 2>/dev/null | sum_of_results /dev/stdin)
    return "$result"
}

# What fails, at once, and a line for each tenth of the tests.
show_progress() {
    awk '
        / (FAILED|ERROR) tests/ { print "  failed: " $NF; fflush() }
        /^tests\/[^ ]+ (FAILED|ERROR)/ { print "  failed: " $1; fflush() }
        match($0, /\[ *[0-9]+%\]/) {
            tenth = int(substr($0, RSTART + 1, RLENGTH - 3) / 10)
            if (tenth > shown) { print "  " tenth * 10 " %"; fflush(); shown = tenth }
        }
        /^E  / && ++lines <= 100 { print "    | " $0 }'
}

# sum_of_results FILE...: how many tests ran, and how many of them failed or were skipped, which proves nothing.
sum_of_results() {
    sed -n 's/.*<testsuite [^>]*errors="\([0-9]*\)" failures="\([0-9]*\)" skipped="\([0-9]*\)" tests="\([0-9]*\)".*/\4 \1 \2 \3/p' \
        "$@" | awk '{ tests += $1; failed += $2 + $3 + $4 } END { print tests + 0, failed + 0 }'
}

suite_target() {
    # shellcheck source=dev.d/target_suite.sh
    . "$ROOT/dev.d/target_suite.sh"
    test_target
}

suite_package() {
    # shellcheck source=dev.d/package_suite.sh
    . "$ROOT/dev.d/package_suite.sh"
    test_packages
}
