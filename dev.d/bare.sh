# A bare Debian root of this machine's mirror and release, kept as an archive, and the packages downloaded for it.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

CACHE=$ROOT/build/fresh
TRASH=()

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
    step --title "\$ debootstrap --variant=minbase $codename" unshare --mount --propagation unchanged \
        bash "$ROOT/dev.d/own_mounts.sh" debootstrap --variant=minbase --include=ca-certificates "$codename" "$root" \
        "$mirror" || die "debootstrap could not make the bare root"
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

# need_bare_root: sets BARE_CODENAME and BARE_ARCHIVE, and makes the archive where there is none.
need_bare_root() {
    local mirror
    BARE_CODENAME=$(. /etc/os-release && printf '%s' "${VERSION_CODENAME:-}")
    read -r mirror _ < <(debian_sources "$BARE_CODENAME") ||
        die "the package sources of this machine name no mirror of Debian $BARE_CODENAME"
    mkdir -p "$CACHE/packages"
    BARE_ARCHIVE=$CACHE/bare-$BARE_CODENAME-$(dpkg --print-architecture).tar
    [[ -f $BARE_ARCHIVE ]] || make_bare_root "$BARE_CODENAME" "$mirror" "$BARE_ARCHIVE"
}

# Makes the next one anew, and downloads all packages again.
forget_bare_root() {
    rm -rf -- "$CACHE"/bare-*.tar "$CACHE/packages"
}

# unpack_bare_root FOLDER: with what it needs to reach the mirror.
unpack_bare_root() {
    step --title "unpacking the bare root" tar -C "$1" -xf "$BARE_ARCHIVE" || die "the bare root could not be unpacked"
    # "mktemp" closes its folder to others, and the archive says so, too; no machine's "/" is closed.
    chmod 755 "$1"
    copy_network "$1" "$BARE_CODENAME"
}

clean_up() {
    local trash
    for trash in "${TRASH[@]}"; do
        # Never across a mount: /dev of this machine may still be there if something went very wrong. A process that
        # was killed may write its last file meanwhile, hence the second try.
        rm -rf --one-file-system -- "$trash" 2>/dev/null || { sleep 2 && rm -rf --one-file-system -- "$trash"; }
    done
}
