# ./dev fresh: the project on a machine that has nothing but Debian.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

for file in packages sources; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

CACHE=$ROOT/build/fresh
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

# The sources of this machine that hold Debian itself, as "URI SUITE" lines; the main suite comes first.
debian_sources() {
    local codename=$1
    # shellcheck disable=SC2016 # apt-get fills these in
    apt-get indextargets --format '$(REPO_URI) $(RELEASE) $(COMPONENT)' 'Created-By: Packages' | sort -u |
        awk -v codename="$codename" '
            $3 == "main" && $2 == codename { print $1, $2 }
            $3 == "main" && ($2 == codename "-updates" || $2 == codename "-security") { rest = rest $1 " " $2 "\n" }
            END { printf "%s", rest }'
}

make_bare_root() {
    local codename=$1 mirror=$2 archive=$3 root
    root=$(mktemp -d "$CACHE/bare.XXXXXX")
    TRASH+=("$root")
    # Mounts of its own, so that whatever debootstrap leaves mounted ends with it. Certificates: the mirror may want them.
    step --title "\$ debootstrap --variant=minbase $codename" unshare --mount debootstrap --variant=minbase \
        --include=ca-certificates "$codename" "$root" "$mirror" || die "debootstrap could not make the bare root"
    step --title "packing it for the next time" tar -C "$root" --one-file-system -cf "$archive.new" . ||
        die "the bare root could not be packed"
    mv -- "$archive.new" "$archive"
    rm -rf --one-file-system -- "$root"
}

# What this machine needs to reach its mirror: name servers, proxies and the like.
copy_network() {
    local root=$1 codename=$2
    rm -f -- "$root/etc/resolv.conf"
    cp -L /etc/resolv.conf /etc/hosts "$root/etc/"
    debian_sources "$codename" | awk '{ print "deb", $1, $2, "main" }' >"$root/etc/apt/sources.list"
    apt-config dump | grep -E '^Acquire::((http|https)::|Check-|ForceIPv|Retries)' >"$root/etc/apt/apt.conf.d/90network" ||
        true
    if [[ -d /usr/local/share/ca-certificates ]]; then
        cp -r /usr/local/share/ca-certificates "$root/usr/local/share/"
    fi
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

clean_up() {
    local trash
    for trash in "${TRASH[@]}"; do
        # Never across a mount: /dev of this machine may still be there if something went very wrong. A process that
        # was killed may write its last file meanwhile, hence the second try.
        rm -rf --one-file-system -- "$trash" 2>/dev/null || { sleep 2 && rm -rf --one-file-system -- "$trash"; }
    done
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
    local worktree=$1 rebuild=$2 codename mirror archive root result=0
    shift 2
    (($# > 0)) || set -- ./dev test
    codename=$(. /etc/os-release && printf '%s' "${VERSION_CODENAME:-}")
    read -r mirror _ < <(debian_sources "$codename") ||
        die "the package sources of this machine name no mirror of Debian $codename"
    mkdir -p "$CACHE/packages"
    archive=$CACHE/bare-$codename-$(dpkg --print-architecture).tar
    if $rebuild; then
        rm -rf -- "$archive" "$CACHE/packages"
        mkdir -p "$CACHE/packages"
    fi
    [[ -f $archive ]] || make_bare_root "$codename" "$mirror" "$archive"

    root=$(mktemp -d "$CACHE/root.XXXXXX")
    TRASH+=("$root")
    step --title "unpacking the bare root" tar -C "$root" -xf "$archive" || die "the bare root could not be unpacked"
    # "mktemp" closes its folder to others, and the archive says so, too; no machine's "/" is closed.
    chmod 755 "$root"
    copy_network "$root" "$codename"
    copy_project "$root" "$worktree" || die "the project could not be copied"
    printf '\nIn the bare root: %s\n\n' "$*"
    # Mounts and processes of its own: both end with the command, however it ends. "unshare" heeds no gentler signal.
    supervise KILL unshare --mount --pid --fork --kill-child bash "$ROOT/dev.d/fresh_inside.sh" "$root" "/$PROJECT" \
        "$CACHE/packages" "$@" || result=$?
    printf '\n'
    ((result == 0)) || die "in the bare root, \"$*\" ended with code $result"
    say "ok: \"$*\" works in a bare Debian root"
}
