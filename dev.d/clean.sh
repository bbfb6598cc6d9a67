# ./dev clean: removes what was built.
# shellcheck shell=bash

usage() {
    cat <<'TEXT'
usage: ./dev clean [--all]

Removes what was built, with its logs and reports. Kept are inputs that a fuzzer found (build/fuzz-found) and the bare
Debian root of "./dev fresh" (build/fresh).

  --all   removes those as well
TEXT
}

main() {
    local all=false
    case ${1:-} in
        -h | --help)
            usage
            return
            ;;
        --all) all=true ;;
        '') ;;
        *) wrong_usage "\"clean\" takes no \"$1\"." ;;
    esac
    local outside=(console/dist console/node_modules tests/browser/node_modules ci-output) path found=false
    for path in build "${outside[@]}"; do
        [[ ! -d $path ]] || found=true
    done
    if ! $found; then
        say "ok: there is nothing to remove"
        return
    fi
    rm -rf --one-file-system -- "${outside[@]}"
    if $all; then
        rm -rf --one-file-system -- build
    elif [[ -d build ]]; then
        find build -mindepth 1 -maxdepth 1 ! -name fuzz-found ! -name fresh -exec rm -rf --one-file-system -- {} +
        rmdir --ignore-fail-on-non-empty build
    fi
    say "ok: removed what was built"
}
