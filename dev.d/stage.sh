# The appliance built as it is shipped, and put into a folder as it lies on a machine: what labs put into their hosts.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

BUILD=$ROOT/build/appliance
STAGE=$ROOT/build/stage
TARGETS=(vorn_directory_domain vorn_platform appliance_directory_module vornd vorn-httpd vornctl vornwin vornjoin vornauth)

# Whether labs can be brought up; said at once, and not after minutes of building.
check_rights() {
    ((EUID == 0)) || die "only root can make namespaces and install packages. Run this as root"
    unshare --pid --fork --mount --net --uts --ipc --propagation unchanged true 2>/dev/null ||
        die "this machine does not let root make namespaces. In a container: start it privileged (docker: --privileged)"
}

CONSOLE=$ROOT/console
CONSOLE_STAMP=$ROOT/build/console.stamp
AUTHORITIES=/etc/ssl/certs/ca-certificates.crt

# The page's tools. One's own node is as good as Debian's, when it is no older.
need_console_packages() {
    if ! command -v node >/dev/null || ! command -v npm >/dev/null; then
        need_packages "${CONSOLE_PACKAGES[@]}"
    fi
    node -e 'process.exit(parseInt(process.versions.node) >= 18 ? 0 : 1)' 2>/dev/null ||
        die "$(command -v node) is too old: the page is built with Node 18 or newer"
    # npm trusts whom the machine trusts, also behind a proxy with a certificate of its own.
    [[ ! -f $AUTHORITIES ]] || export NODE_EXTRA_CA_CERTS=${NODE_EXTRA_CA_CERTS:-$AUTHORITIES}
}

# Whether the page was built after the last change of anything that it is made of, folders included.
console_is_new() {
    [[ -f $CONSOLE/dist/index.html && -f $CONSOLE_STAMP ]] &&
        [[ -z $(find "$CONSOLE" "$ROOT/appliance/catalogue" -mindepth 1 \
            \( -path "$CONSOLE/node_modules" -o -path "$CONSOLE/dist" \) -prune -o \
            -newer "$CONSOLE_STAMP" -print -quit) ]]
}

fetch_console_libraries() {
    local modules=$CONSOLE/node_modules/.package-lock.json
    need_console_packages
    if [[ ! -f $modules || $CONSOLE/package-lock.json -nt $modules ]]; then
        step --title "\$ npm ci (in ${CONSOLE#"$ROOT"/})" npm --prefix "$CONSOLE" ci --no-audit --no-fund ||
            die "the libraries of the page could not be installed. The reason is above"
    fi
}

build_console() {
    ! console_is_new || return 0
    fetch_console_libraries
    rm -f -- "$CONSOLE_STAMP"
    { mkdir -p -- "${CONSOLE_STAMP%/*}" && : >"$CONSOLE_STAMP.new"; } || die "${CONSOLE_STAMP%/*} can't be written"
    step --title "\$ npm run build (in ${CONSOLE#"$ROOT"/})" npm --prefix "$CONSOLE" run build ||
        die "the page could not be built"
    [[ -f $CONSOLE/dist/index.html ]] || die "the build of the page has left no page"
    # As old as the begin of the build: what was changed meanwhile is built next time.
    mv -- "$CONSOLE_STAMP.new" "$CONSOLE_STAMP"
}

build_stage() {
    build_console
    drop_foreign_build "$BUILD"
    step cmake --preset release -B "${BUILD#"$ROOT"/}" -D VORN_BUILD_APPLIANCE=ON \
        -D VORN_BUILD_BENCH=OFF -D VORN_BUILD_LIBRARY_TESTS=OFF ||
        die "CMake could not configure the appliance"
    step --title "\$ cmake --build ${BUILD#"$ROOT"/}" \
        cmake --build "$BUILD" --parallel "$(cores)" --target "${TARGETS[@]}" ||
        die "the appliance could not be built"
    rm -rf -- "$STAGE.new"
    step --title "\$ cmake --install ${BUILD#"$ROOT"/} (into ${STAGE#"$ROOT"/})" \
        env DESTDIR="$STAGE.new" cmake --install "$BUILD" --strip || die "the appliance could not be staged"
    [[ -f $STAGE.new/usr/vorn/share/console/index.html ]] || die "the page could not be staged"
    # Whole or not there, also when this is interrupted.
    { rm -rf -- "$STAGE" && mv -- "$STAGE.new" "$STAGE"; } || die "${STAGE#"$ROOT"/} can't be replaced"
}
