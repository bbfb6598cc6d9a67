# What the target's builds need beyond the machine's own packages: a JSON library for it, which Debian has as a source
# package only.
# shellcheck shell=bash disable=SC2153 # ROOT and LOG are of the files that read this one

TARGET_PREFIX=$ROOT/build/powerpc-prefix
TARGET_SOURCES=$ROOT/build/powerpc-sources
TOOLCHAIN=$ROOT/cmake/powerpc-linux-gnu.cmake
JSON_SOURCE=libjsoncpp

# The machine's own package sources, for source packages. Both forms of lists; nothing of the machine changes.
write_source_lists() {
    local list
    for list in /etc/apt/sources.list.d/*.sources; do
        [[ ! -e $list ]] || sed 's/^Types:.*/Types: deb-src/' "$list" >"$1/$(basename "$list")"
    done
    for list in /etc/apt/sources.list /etc/apt/sources.list.d/*.list; do
        [[ ! -e $list ]] || sed -n 's/^[[:blank:]]*deb\([[:blank:]].*\)/deb-src\1/p' "$list" >"$1/$(basename "$list")"
    done
}

# apt_source PACKAGE FOLDER: the package's source, as the machine's signed lists name it, unpacked into FOLDER/source.
apt_source() {
    local folder=$2 options
    rm -rf -- "$folder"
    mkdir -p "$folder/parts" "$folder/lists" "$folder/cache" "$folder/download"
    write_source_lists "$folder/parts"
    options=(-q -o Dir::Etc::sourcelist=/dev/null -o "Dir::Etc::sourceparts=$folder/parts"
        -o "Dir::State::lists=$folder/lists" -o "Dir::Cache=$folder/cache" -o Acquire::Retries=3
        -o APT::Sandbox::User=root)
    step --title "\$ apt-get update (source packages, in ${folder#"$ROOT"/})" apt-get "${options[@]}" update &&
        (cd -- "$folder/download" && step apt-get "${options[@]}" source --download-only "$1") &&
        dpkg-source -x "$folder"/download/*.dsc "$folder/source" >>"$LOG" 2>&1
}

# make_target_json SOURCE BUILD: into a new prefix, when its tests pass.
make_target_json() {
    step --title "\$ cmake $JSON_SOURCE (for the target)" cmake -G Ninja -S "$1" -B "$2" --toolchain "$TOOLCHAIN" \
        -D CMAKE_BUILD_TYPE=MinSizeRel -D CMAKE_INSTALL_PREFIX="$TARGET_PREFIX" -D BUILD_SHARED_LIBS=ON \
        -D BUILD_STATIC_LIBS=OFF -D BUILD_OBJECT_LIBS=OFF -D JSONCPP_WITH_POST_BUILD_UNITTEST=OFF \
        -D CMAKE_INSTALL_INCLUDEDIR=include/jsoncpp &&
        step --title "\$ cmake --build (the same)" cmake --build "$2" --parallel "$(cores)" &&
        step --title "\$ ctest (the same)" ctest --test-dir "$2" --output-on-failure --tests-regex '^jsoncpp_test$' \
            --no-tests=error &&
        cmake --install "$2" --prefix "$TARGET_PREFIX.new" >>"$LOG" 2>&1
}

# The target's JSON library, built once and tested, in a prefix of its own. Whole or not there. Its other tests start its
# programs from scripts, which would need a kernel that runs programs of the target by itself.
build_target_prefix() {
    local work=$TARGET_SOURCES/$JSON_SOURCE build=$TARGET_SOURCES/build
    [[ ! -e $TARGET_PREFIX/lib/libjsoncpp.so ]] || return 0
    apt_source "$JSON_SOURCE" "$work" || die "the source of $JSON_SOURCE could not be fetched"
    rm -rf -- "$build" "$TARGET_PREFIX.new"
    make_target_json "$work/source" "$build" || die "$JSON_SOURCE could not be built for the target"
    rm -rf -- "$TARGET_PREFIX"
    mv -- "$TARGET_PREFIX.new" "$TARGET_PREFIX"
}
