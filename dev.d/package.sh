# ./dev package: what others install, as files of one version.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

for file in packages sources cmake stage target package_target package_debian; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

usage() {
    cat <<'TEXT'
usage: ./dev package [--output FOLDER] [--part target|debian]

Builds what others install, and puts it into build/packages or the folder, with checksums:

  vorn-directory-domain-VERSION-powerpc-linux-gnu.tar.xz   the target's library, its debug symbols, and the contract
  vorn-directory-domain_VERSION_ARCHITECTURE.deb           the module for this machine's architecture
  vorn-appliance_VERSION_ARCHITECTURE.deb                  platform, servers and tools of a Debian machine
  vorn-console_VERSION_all.deb                             the administrator's page

The same commit gives the same bytes, wherever and whenever it is built. The version is CMake's; every file is as old as
the last commit, or as SOURCE_DATE_EPOCH says. docs/packages.md tells what the packages hold and change.

  --output FOLDER   files of the same names are replaced there, others stay
  --part PART       only the tar, or only the Debian packages; may be given once
TEXT
}

main() {
    local output=$ROOT/build/packages parts=(target debian)
    while (($# > 0)); do
        case $1 in
            -h | --help)
                usage
                return
                ;;
            --output)
                [[ -n ${2:-} ]] || wrong_usage "--output takes a folder."
                output=$(realpath -m -- "$2")
                shift
                ;;
            --part)
                [[ ${2:-} == target || ${2:-} == debian ]] || wrong_usage "--part takes \"target\" or \"debian\"."
                parts=("$2")
                shift
                ;;
            *) wrong_usage "\"package\" takes no \"$1\"." ;;
        esac
        shift
    done
    { mkdir -p -- "$output" 2>/dev/null && [[ -w $output ]]; } || die "the folder $output can't be written"
    start_log
    need_packages "${PACKAGE_PACKAGES[@]}"
    make_packages "$output" "${parts[@]}"
}

make_packages() {
    local output=$1 version work part
    shift
    # Not as it is where and when somebody builds.
    umask 022
    export TZ=UTC0 LC_ALL=C.UTF-8
    version=$(project_version)
    SOURCE_DATE_EPOCH=$(version_date)
    export SOURCE_DATE_EPOCH
    work=$(mktemp -d -- "$output/.making.XXXXXX")
    # shellcheck disable=SC2064 # this folder
    trap "rm -rf --one-file-system -- '${work//\'/\'\\\'\'}'" EXIT
    mkdir "$work/made"
    for part in "$@"; do
        "package_$part" "$version" "$work"
    done
    (cd -- "$work/made" && sha256sum -- *) >"$work/SHA256SUMS"
    # The checksums last: as long as they are the old ones, they tell of files that are being replaced.
    { mv -f -- "$work"/made/* "$output/" && mv -f -- "$work/SHA256SUMS" "$output/"; } ||
        die "the files can't be put into $output"
    show_files "$output"
}

# Of project() in CMakeLists.txt, where every other mention of the version comes from.
project_version() {
    local version
    version=$(sed -n 's/^project([a-z_]* VERSION \([0-9.]*\) .*/\1/p' "$ROOT/CMakeLists.txt")
    [[ $version =~ ^[0-9]+(\.[0-9]+)+$ ]] || die "CMakeLists.txt does not tell the version"
    printf '%s' "$version"
}

# In seconds. Without git it is the time of the newest file: git gives all files of an archive the commit's.
version_date() {
    local top
    if [[ -n ${SOURCE_DATE_EPOCH:-} ]]; then
        [[ $SOURCE_DATE_EPOCH =~ ^[0-9]+$ ]] || die "SOURCE_DATE_EPOCH is \"$SOURCE_DATE_EPOCH\", which is no time in seconds"
        printf '%s' "$SOURCE_DATE_EPOCH"
    elif top=$(git rev-parse --show-toplevel 2>/dev/null) && [[ $top == "$ROOT" ]] &&
        git log -1 --format=%ct 2>/dev/null; then
        :
    else
        project_files | tr '\n' '\0' | xargs -0 stat -c %Y -- | sort -n | tail -n 1
    fi
}

show_files() {
    local size name
    printf '\n'
    while read -r _ name; do
        size=$(stat -c %s -- "$1/$name")
        printf '  %10d  %s\n' "$size" "$name"
    done <"$1/SHA256SUMS"
    printf '\n'
    say "ok: $(wc -l <"$1/SHA256SUMS") files and their SHA256SUMS are in ${1#"$ROOT"/}"
}
