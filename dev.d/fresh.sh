# ./dev fresh: the project on a machine that has nothing but Debian.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

for file in packages sources bare; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

PROJECT=root/project  # where the project lies in the new root

usage() {
    cat <<'TEXT'
usage: ./dev fresh [--worktree] [--rebuild] [COMMAND [ARGUMENT...]]

Makes a bare Debian root, copies the last commit into it, and runs "./dev test" there, or the command, as root. What the
project needs and does not install itself shows in this way. The root's mirror and release are those of this machine.
Afterwards the root is gone. Kept for the next time, in build/fresh: the bare root as an archive, and the packages that
were downloaded, which are installed anew each time.

  --worktree   copy the files as they are now instead of the last commit
  --rebuild    make the bare root anew and download all packages again

Needs root, and the right to mount (in a container: a privileged one).
TEXT
}

copy_project() {
    local root=$1 worktree=$2
    mkdir -p "$root/$PROJECT"
    if $worktree; then
        project_files | tar -cf - --verbatim-files-from --files-from - | tar -xf - -C "$root/$PROJECT"
    else
        git archive HEAD | tar -xf - -C "$root/$PROJECT"
    fi
}

main() {
    local worktree=false rebuild=false
    while (($# > 0)); do
        case $1 in
            -h | --help)
                usage
                return
                ;;
            --worktree) worktree=true ;;
            --rebuild) rebuild=true ;;
            --)
                shift
                break
                ;;
            -*) wrong_usage "There is no option \"$1\"." ;;
            *) break ;;
        esac
        shift
    done
    ((EUID == 0)) || die "only root can make a root"
    if ! $worktree && ! git rev-parse --verify --quiet HEAD >/dev/null; then
        die "there is no commit to take; --worktree takes the files as they are"
    fi
    start_log
    need_packages "${FRESH_PACKAGES[@]}"
    TRASH=()
    trap clean_up EXIT
    run_in_fresh_root "$worktree" "$rebuild" "$@"
}

run_in_fresh_root() {
    local worktree=$1 rebuild=$2 root result=0
    shift 2
    (($# > 0)) || set -- ./dev test
    ! $rebuild || forget_bare_root
    need_bare_root

    root=$(mktemp -d "$CACHE/root.XXXXXX")
    TRASH+=("$root")
    unpack_bare_root "$root"
    copy_project "$root" "$worktree" || die "the project could not be copied"
    printf '\nIn the bare root: %s\n\n' "$*"
    # Mounts and processes of its own: both end with the command, however it ends. "unshare" heeds no gentler signal.
    supervise KILL unshare --mount --pid --fork --kill-child bash "$ROOT/dev.d/fresh_inside.sh" "$root" "/$PROJECT" \
        "$CACHE/packages" "$@" || result=$?
    printf '\n'
    ((result == 0)) || die "in the bare root, \"$*\" ended with code $result"
    say "ok: \"$*\" works in a bare Debian root"
}
