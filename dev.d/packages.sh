# The Debian packages that each kind of work needs.
# shellcheck shell=bash disable=SC2034 # used by the files that read this one

BUILD_PACKAGES=(g++ cmake ninja-build libjsoncpp-dev)
TEST_PACKAGES=("${BUILD_PACKAGES[@]}" libgtest-dev libgmock-dev)
RELEASE_PACKAGES=("${TEST_PACKAGES[@]}" libbenchmark-dev binutils python3 valgrind)
CLANG_PACKAGES=("${BUILD_PACKAGES[@]}" clang)
LINT_PACKAGES=("${CLANG_PACKAGES[@]}" clang-tidy)
FUZZ_PACKAGES=("${CLANG_PACKAGES[@]}" libclang-rt-14-dev)
MUTATE_PACKAGES=("${TEST_PACKAGES[@]}" clang-14 python3 python3-clang-14)
FORMAT_PACKAGES=(clang-format)
COVERAGE_PACKAGES=("${TEST_PACKAGES[@]}" gcovr)
SHELL_PACKAGES=(shellcheck)
FRESH_PACKAGES=(debootstrap)

packages_of_preset() {
    case $1 in
        dev | asan-ubsan | tsan) printf '%s\n' "${TEST_PACKAGES[@]}" ;;
        coverage) printf '%s\n' "${COVERAGE_PACKAGES[@]}" ;;
        fuzz) printf '%s\n' "${FUZZ_PACKAGES[@]}" ;;
        release) printf '%s\n' "${RELEASE_PACKAGES[@]}" ;;
    esac
}

missing_packages() {
    local package
    for package in "$@"; do
        [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) == installed ]] || printf '%s\n' "$package"
    done
}

# Installs those of the packages that are missing. Without any, neither the network nor root is needed.
need_packages() {
    local missing
    command -v dpkg-query >/dev/null || die "this is no Debian: dpkg-query is missing, so packages can't be checked"
    mapfile -t missing < <(missing_packages "$@" | sort -u)
    if ((${#missing[@]} == 0)); then
        return
    fi
    say "Installing ${missing[*]}"
    if ((EUID != 0)); then
        die "only root can install packages. Run this as root once:  apt-get install ${missing[*]}"
    fi
    local options=(-q -o DPkg::Lock::Timeout=300 -o Acquire::Retries=3)
    step apt-get "${options[@]}" update ||
        die "apt-get update failed. Check the network and the sources in /etc/apt, then try again"
    step env DEBIAN_FRONTEND=noninteractive apt-get "${options[@]}" install -y --no-install-recommends "${missing[@]}" ||
        die "apt-get could not install the packages. The reason is above"
}
