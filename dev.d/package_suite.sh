# The suite "package": the files that others install are made twice, looked at, and installed on machines of their own.
# shellcheck shell=bash disable=SC2034,SC2153 # variables shared with the files that this one stands beside

for file in bare package; do
    # shellcheck source=/dev/null
    . "$ROOT/dev.d/$file.sh"
done

PACKAGE_TEST=$ROOT/build/package-test

test_packages() {
    local results=$LOGS/package.xml begin result=0 tests=0 failed=0
    TRASH=("$PACKAGE_TEST")
    trap clean_up EXIT
    rm -rf --one-file-system -- "$PACKAGE_TEST"
    mkdir -p "$PACKAGE_TEST"/{first,again,elsewhere,archives}
    # Later than anything that is made now: what is not given this time on purpose shows.
    export SOURCE_DATE_EPOCH=$((EPOCHSECONDS + 86400))
    (make_packages "$PACKAGE_TEST/first" target debian) || die "the packages could not be made"
    printf '\nThe same once more: the tar in another place, the Debian packages as somebody else\n'
    make_elsewhere
    (umask 077 && TZ=Asia/Tokyo make_packages "$PACKAGE_TEST/again" debian) || die "the packages could not be made a second time"
    make_test_root
    rm -f -- "$results"
    begin=$EPOCHREALTIME
    say "  \$ pytest tests/package"
    /usr/bin/python3 -m pytest tests/package -p no:cacheprovider -v --durations=15 --junitxml "$results" \
        --packages="$PACKAGE_TEST/first" --again="$PACKAGE_TEST/again" --elsewhere="$PACKAGE_TEST/elsewhere" \
        --bare-root="$PACKAGE_TEST/root" --archives="$PACKAGE_TEST/archives" --target-prefix="$TARGET_PREFIX" \
        2>&1 </dev/null | tee -a "$LOG" | show_progress || result=$?
    printf '  %-62s %8s s\n' "" "$(seconds_since "$begin")"
    # What was downloaded serves the next time, and "./dev fresh".
    cp -aln -- "$PACKAGE_TEST"/archives/*.deb "$CACHE/packages/" 2>/dev/null || true
    if [[ -f $results ]]; then
        read -r tests failed < <(sum_of_results "$results")
    fi
    count "$tests" "$failed"
    return "$result"
}

# The target's library in a folder whose name has another length, from files of another age, by somebody with other habits.
make_elsewhere() {
    local place=$PACKAGE_TEST/another/place/for/the/same/sources
    mkdir -p "$place/build"
    project_files | tar -cf - --verbatim-files-from --files-from - | tar -xmf - -C "$place"
    cp -a -- "$TARGET_PREFIX" "$place/build/"
    (
        umask 077
        step --title "\$ ./dev package --part target (in another folder)" env TZ=Asia/Tokyo \
            "$place/dev" package --part target --output "$PACKAGE_TEST/elsewhere"
    ) || die "the target's library could not be made in another folder"
}

# A bare root with the lists of its mirror; what has been downloaded before is not downloaded again.
make_test_root() {
    need_bare_root
    mkdir "$PACKAGE_TEST/root"
    unpack_bare_root "$PACKAGE_TEST/root"
    cp -al -- "$CACHE"/packages/*.deb "$PACKAGE_TEST/archives/" 2>/dev/null || true
}
