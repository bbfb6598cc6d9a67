# The appliance built as it is shipped, and put into a folder as it lies on a machine: what labs put into their hosts.
# shellcheck shell=bash disable=SC2153 # ROOT is of the file that reads this one

BUILD=$ROOT/build/appliance
STAGE=$ROOT/build/stage
TARGETS=(vorn_directory_domain vorn_platform appliance_directory_module vornd vornctl vornwin vornjoin)

# Whether labs can be brought up; said at once, and not after minutes of building.
check_rights() {
    ((EUID == 0)) || die "only root can make namespaces and install packages. Run this as root"
    unshare --pid --fork --mount --net --uts --ipc --propagation unchanged true 2>/dev/null ||
        die "this machine does not let root make namespaces. In a container: start it privileged (docker: --privileged)"
}

build_stage() {
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
    # Whole or not there, also when this is interrupted.
    { rm -rf -- "$STAGE" && mv -- "$STAGE.new" "$STAGE"; } || die "${STAGE#"$ROOT"/} can't be replaced"
}
