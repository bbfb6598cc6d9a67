# ./dev format: the project's format for the C++ sources.
# shellcheck shell=bash

for file in packages sources; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev format [--check]

Brings all C++ sources into the format of .clang-format and names the files that it changed.

  --check   change nothing; fail when a file is not in the format
TEXT
}

main() {
    local check=false files=() wrong=() file
    case ${1:-} in
        -h | --help)
            usage
            return
            ;;
        --check) check=true ;;
        '') ;;
        *) wrong_usage "\"format\" takes no \"$1\"." ;;
    esac
    start_log
    need_packages "${FORMAT_PACKAGES[@]}"
    mapfile -t files < <(cpp_files)
    for file in "${files[@]}"; do
        clang-format --dry-run -Werror "$file" >>"$LOG" 2>&1 || wrong+=("$file")
    done
    if ((${#wrong[@]} == 0)); then
        say "ok: all ${#files[@]} files are in the format"
        return
    fi
    printf '  %s\n' "${wrong[@]}"
    if $check; then
        die "${#wrong[@]} files are not in the format. \"./dev format\" changes them"
    fi
    clang-format -i "${wrong[@]}" || die "clang-format could not change the files"
    say "ok: changed ${#wrong[@]} of ${#files[@]} files"
}
