# The Debian packages, out of the staged tree.
# shellcheck shell=bash disable=SC2153 # ROOT, LOG, STAGE and CONSOLE are of the files that read this one

# package_debian VERSION WORK
package_debian() {
    local work=$2 source=$2/source package
    printf '\nThe Debian packages\n'
    build_stage
    # The licences of what the page is made of lie beside its libraries.
    fetch_console_libraries
    mkdir -p "$source"
    cp -r -- "$ROOT/packaging/debian" "$source/debian"
    cp -r -- "$STAGE" "$source/stage"
    cp -- "$ROOT/README.md" "$ROOT/SECURITY.md" "$ROOT/docs/packages.md" "$source/"
    cp -- "$ROOT/CHANGELOG.md" "$source/NEWS.md"
    write_changelog "$1" >"$source/debian/changelog"
    /usr/bin/python3 -B "$ROOT/packaging/licences.py" "$CONSOLE" >"$source/LICENCES" ||
        die "the licences of the page's libraries could not be gathered"
    step --title "\$ debian/rules binary" make_debs "$source" || die "the packages could not be made"
    for package in "$work"/*.deb; do
        mv -- "$package" "$work/made/"
    done
}

write_changelog() {
    cat <<TEXT
vorn-directory-domain ($1) stable; urgency=medium

  * Version $1. /usr/share/doc/vorn-appliance/NEWS.md tells what is new.

 -- The project's maintainers <root@localhost>  $(date --utc --rfc-email --date="@$SOURCE_DATE_EPOCH")
TEXT
}

# Owners come out as root's without being root; settings of whoever builds are left outside.
make_debs() {
    cd -- "$1" &&
        env -i "PATH=$PATH" LC_ALL=C.UTF-8 TZ=UTC0 HOME=/nonexistent DEB_RULES_REQUIRES_ROOT=no \
            "SOURCE_DATE_EPOCH=$SOURCE_DATE_EPOCH" debian/rules binary
}
