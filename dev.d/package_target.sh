# The tar for the target: library, debug symbols, and what whoever integrates it has to supply.
# shellcheck shell=bash disable=SC2153 # ROOT, LOG and TARGET_PREFIX are of the files that read this one

TARGET_TRIPLET=powerpc-linux-gnu
TARGET_BUILD=$ROOT/build/powerpc

# package_target VERSION WORK
package_target() {
    local name=vorn-directory-domain-$1-$TARGET_TRIPLET work=$2 folder=$2/target/vorn-directory-domain-$1-$TARGET_TRIPLET
    printf '\nThe library for %s\n' "$TARGET_TRIPLET"
    build_target_library
    install -d -m 755 "$folder"/{lib,debug,include/platform}
    split_library "$TARGET_BUILD/src/vorn_directory_domain.so" "$folder"
    install -m 644 "$ROOT"/platform/*.h "$folder/include/platform"
    install -m 644 "$ROOT/platform/symbols.txt" "$ROOT/tests/library/exports.txt" "$ROOT/LICENSE" "$folder"
    check_symbols "$folder/lib/vorn_directory_domain.so"
    sed "s/@VERSION@/$1/g; s/@TRIPLET@/$TARGET_TRIPLET/g" "$ROOT/packaging/target/README.md" >"$folder/README.md"
    (cd -- "$folder" && find . -type f -printf '%P\n' | sort | xargs -d '\n' sha256sum --) >"$work/SHA256SUMS.target"
    install -m 644 "$work/SHA256SUMS.target" "$folder/SHA256SUMS"
    step --title "packing $name.tar.xz" pack_tar "$work/target" "$name" "$work/made/$name.tar.xz" ||
        die "the tar could not be packed"
}

build_target_library() {
    build_target_prefix
    drop_foreign_build "$TARGET_BUILD"
    configure powerpc || die "CMake could not configure the target's build"
    build powerpc vorn_directory_domain || die "the target's library could not be built; the first error is above"
}

# split_library LIBRARY FOLDER: what runs, and apart from it what a debugger reads. A debugger finds the one by the
# other's build id or by the link.
split_library() {
    local stripped=$2/lib/vorn_directory_domain.so symbols=$2/debug/vorn_directory_domain.so.debug
    "$TARGET_TRIPLET-readelf" --notes "$1" | grep -q 'Build ID: ' || die "the target's library has no build id"
    {
        "$TARGET_TRIPLET-objcopy" --only-keep-debug "$1" "$symbols" &&
            "$TARGET_TRIPLET-objcopy" --strip-unneeded --add-gnu-debuglink="$symbols" "$1" "$stripped" &&
            chmod 644 "$symbols" "$stripped"
    } >>"$LOG" 2>&1 || die "the debug symbols could not be put apart; build/logs/$COMMAND.log tells why"
}

# What the appliance must supply, as it is written down, and what the library asks for are the same.
check_symbols() {
    step --title "\$ symbols_check.py (the library against the lists)" \
        env "VORN_LIBRARY_FOLDERS=$TARGET_PREFIX/lib:/usr/$TARGET_TRIPLET/lib" \
        /usr/bin/python3 -B "$ROOT/tests/library/symbols_check.py" "$1" \
        "$ROOT/tests/library/exports.txt" "$ROOT/platform/symbols.txt" ||
        die "the library's symbols are not those of platform/symbols.txt and tests/library/exports.txt"
}

# pack_tar FOLDER NAME FILE: the same bytes for the same contents.
pack_tar() {
    tar -C "$1" --format=ustar --sort=name --mtime="@$SOURCE_DATE_EPOCH" --owner=0 --group=0 --numeric-owner \
        --mode='u=rwX,go=rX' -cf "$3.tar" "$2" &&
        xz --threads=1 -6 --stdout "$3.tar" >"$3" && rm -f -- "$3.tar"
}
