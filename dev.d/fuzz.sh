# ./dev fuzz: the fuzzers, each for a while.
# shellcheck shell=bash

for file in packages cmake; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

# Not in a build folder: what a fuzzer found must outlive "./dev clean".
FOUND=$ROOT/build/fuzz-found

usage() {
    cat <<'TEXT'
usage: ./dev fuzz [--seconds N] [--list] [TARGET...]

Builds the fuzzers with clang and runs all of them, or the targets, one after the other, each for N seconds (60), from
the inputs in fuzz/corpus. New inputs that reach new code are kept in build/fuzz/corpus and used again next time. An
input that breaks something is kept in build/fuzz-found; its path is printed, and the exit code is 1.

  --seconds N   time for each target
  --list        name the targets

A target is named like the operation, for example DomainSet.
TEXT
}

fuzz_targets() {
    local path
    for path in build/fuzz/fuzz/fuzz_*; do
        if [[ -f $path && -x $path ]]; then
            printf '%s\n' "${path##*/fuzz_}"
        fi
    done
}

# fuzz_one TARGET SECONDS: what the fuzzer says at its end, and what it found.
fuzz_one() {
    local target=$1 seconds=$2 grown=build/fuzz/corpus/$1 found=$FOUND/$1 given=() before result=0
    mkdir -p "$grown" "$found"
    [[ ! -d fuzz/corpus/$target ]] || given=("fuzz/corpus/$target")
    before=$(find "$found" -type f | sort)
    # The first folder takes the new inputs. The sanitizers' own limits on time and memory catch what hangs or grows.
    step --title "$target for $seconds s" plain_addresses timeout --kill-after=20 $((seconds + 120)) \
        "build/fuzz/fuzz/fuzz_$target" -max_total_time="$seconds" -timeout=25 -rss_limit_mb=2048 -print_final_stats=1 \
        -artifact_prefix="$found/" "$grown" "${given[@]}" || result=$?
    if ((result == 0)); then
        say "    $(grep -a 'stat::number_of_executed_units' "$LOG" | tail -n 1 | tr -dc 0-9) inputs tried," \
            "$(find "$grown" -type f | wc -l) kept"
    fi
    comm -13 <(printf '%s\n' "$before") <(find "$found" -type f | sort) | while IFS= read -r path; do
        say "    kept: ${path#"$ROOT"/}"
    done
    return "$result"
}

main() {
    local seconds=60 targets=() all=() list=false failed=() target
    while (($# > 0)); do
        case $1 in
            -h | --help)
                usage
                return
                ;;
            --seconds)
                [[ ${2:-} =~ ^[1-9][0-9]*$ ]] || wrong_usage "--seconds takes a number of seconds."
                seconds=$2
                shift
                ;;
            --list) list=true ;;
            -*) wrong_usage "There is no option \"$1\"." ;;
            *) targets+=("${1#fuzz_}") ;;
        esac
        shift
    done
    start_log
    need_packages "${FUZZ_PACKAGES[@]}"
    configure fuzz || die "CMake could not configure the fuzzers"
    build fuzz || die "the fuzzers could not be built"
    mapfile -t all < <(fuzz_targets)
    ((${#all[@]} > 0)) || die "no fuzzers were built"
    if $list; then
        printf '%s\n' "${all[@]}"
        say "ok: ${#all[@]} targets"
        return
    fi
    for target in "${targets[@]}"; do
        [[ " ${all[*]} " == *" $target "* ]] || wrong_usage "There is no target \"$target\"; --list names them."
    done
    ((${#targets[@]} > 0)) || targets=("${all[@]}")
    for target in "${targets[@]}"; do
        fuzz_one "$target" "$seconds" || failed+=("$target")
    done
    ((${#failed[@]} == 0)) ||
        die "${failed[*]} failed. The inputs named above repeat it: build/fuzz/fuzz/fuzz_TARGET INPUT"
    say "ok: ${#targets[@]} targets, $seconds s each, nothing found"
}
