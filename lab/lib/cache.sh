# Provisioned controllers, kept as archives. The name of an archive holds a digest of all that went into it.
# shellcheck shell=bash

USE_CACHE=true
CACHE_DAYS=30
TAR_OPTIONS=(--xattrs "--xattrs-include=*" --acls)

# archive_name NAME FILE... -- INPUT...: where the archive belongs. The files are those of the lab that take part in
# making it; whoever changes one of them gets another archive.
archive_name() {
    local name=$1 digest
    shift
    digest=$({
        printf '%s\n' "$(samba -V)" "$(dpkg-query -W samba samba-ad-provision python3-samba passwd 2>&1)"
        while [[ $1 != -- ]]; do
            cat -- "$LAB_HOME/$1"
            shift
        done
        printf '%s\n' "$@"
    } | sha256sum)
    printf '%s/%s-%s.tar' "$CACHE" "$name" "${digest:0:20}"
}

# restore HOST ARCHIVE: fails when there is none; one that can't be read goes.
restore() {
    $USE_CACHE && [[ -s $2 ]] || return 1
    touch -- "$2"
    # Read to its end first, so that half an archive leaves nothing in the host.
    if ! tar -tf "$2" >/dev/null 2>&1 ||
        ! inside "$1" tar "${TAR_OPTIONS[@]}" -C / -xpf - <"$2" 2>"$STATE/$1.restore.log"; then
        say "  the archive $2 can't be read and is made anew"
        rm -f -- "$2"
        return 1
    fi
}

# keep HOST ARCHIVE PATH...: writes beside the archive and renames, so that an archive is whole or not there. A full or
# read-only disk costs time later, nothing else.
keep() {
    local host=$1 archive=$2 partial
    shift 2
    if ! { (umask 077 && mkdir -p -- "$CACHE") && partial=$(mktemp "$CACHE/.partial.XXXXXX"); } 2>/dev/null; then
        say "  nothing can be kept in $CACHE; the next time takes as long as this one"
        return 0
    fi
    if inside "$host" tar "${TAR_OPTIONS[@]}" -C / -cf - "${@#/}" >"$partial" && sync -- "$partial"; then
        mv -- "$partial" "$archive"
    else
        rm -f -- "$partial"
        say "  $archive could not be written; the next time takes as long as this one"
    fi
    # What a killed command left, and what nobody has used for long.
    find "$CACHE" -maxdepth 1 -type f \( -name '.partial.*' -mmin +60 -o -name '*.tar' -mtime +"$CACHE_DAYS" \) -delete
}
