# The Debian packages that each kind of work needs.
# shellcheck shell=bash disable=SC2034 # used by the files that read this one

MODULE_PACKAGES=(g++ cmake ninja-build libjsoncpp-dev)
# What the Debian machine's side needs beyond the module.
APPLIANCE_PACKAGES=(pkg-config libboost1.81-dev libcli11-dev libkrb5-dev libldap-dev libsqlite3-dev libtdb-dev
    libpam0g-dev libssl-dev libwbclient-dev)
BUILD_PACKAGES=("${MODULE_PACKAGES[@]}" "${APPLIANCE_PACKAGES[@]}")
TEST_PACKAGES=("${BUILD_PACKAGES[@]}" libgtest-dev libgmock-dev)
# The appliance without a domain is tested with Samba's own reader of configuration files beside it.
PLATFORM_PACKAGES=("${TEST_PACKAGES[@]}" acl iproute2 python3 samba samba-common-bin winbind)
RELEASE_PACKAGES=("${TEST_PACKAGES[@]}" libbenchmark-dev abigail-tools binutils python3 valgrind)
CLANG_PACKAGES=("${BUILD_PACKAGES[@]}" clang)
LINT_PACKAGES=("${CLANG_PACKAGES[@]}" clang-tidy)
FUZZ_PACKAGES=("${CLANG_PACKAGES[@]}" libclang-rt-14-dev)
MUTATE_PACKAGES=("${TEST_PACKAGES[@]}" clang-14 python3 python3-clang-14)
# The page; any other Node from 18 on does as well.
CONSOLE_PACKAGES=(nodejs npm)
FORMAT_PACKAGES=(clang-format)
COVERAGE_PACKAGES=("${TEST_PACKAGES[@]}" gcovr)
SHELL_PACKAGES=(shellcheck)
FRESH_PACKAGES=(debootstrap)
LAB_PACKAGES=(samba winbind samba-dsdb-modules samba-vfs-modules samba-ad-provision smbclient ldb-tools krb5-user
    libsasl2-modules-gssapi-mit bind9-dnsutils libnss-winbind nftables attr acl iproute2 procps busybox cron curl
    python3 python3-samba)
E2E_PACKAGES=("${BUILD_PACKAGES[@]}" "${LAB_PACKAGES[@]}" binutils libfaketime openssl python3-pytest
    python3-pytest-xdist wrk)
# The browser for the tests of the page; what they are written for is Debian's own.
BROWSER_PACKAGES=("${BUILD_PACKAGES[@]}" "${LAB_PACKAGES[@]}" chromium)
# The module for the target: a compiler for it, its emulator, and the sources of the JSON library that Debian has none of.
TARGET_PACKAGES=("${MODULE_PACKAGES[@]}" g++-powerpc-linux-gnu qemu-user googletest abigail-tools binutils dpkg-dev python3)
# The files for others.
PACKAGE_PACKAGES=("${BUILD_PACKAGES[@]}" "${TARGET_PACKAGES[@]}" debhelper xz-utils)
# They are installed, run and removed on a machine of their own, made from a bare Debian root.
PACKAGE_TEST_PACKAGES=("${PACKAGE_PACKAGES[@]}" "${FRESH_PACKAGES[@]}" curl git iproute2 lintian
    python3-pytest util-linux)
# realmd and adcli are measured beside the appliance; realmd answers on a message bus.
APPLIANCE_BENCH_PACKAGES=("${RELEASE_PACKAGES[@]}" "${LAB_PACKAGES[@]}" realmd adcli dbus)

packages_of_preset() {
    case $1 in
        dev | asan-ubsan | tsan) printf '%s\n' "${TEST_PACKAGES[@]}" ;;
        coverage) printf '%s\n' "${COVERAGE_PACKAGES[@]}" ;;
        fuzz) printf '%s\n' "${FUZZ_PACKAGES[@]}" ;;
        release) printf '%s\n' "${RELEASE_PACKAGES[@]}" ;;
        powerpc*) printf '%s\n' "${TARGET_PACKAGES[@]}" ;;
    esac
}

missing_packages() {
    local package
    for package in "$@"; do
        [[ $(dpkg-query -W -f '${db:Status-Status}' "$package" 2>/dev/null) == installed ]] || printf '%s\n' "$package"
    done
}

POLICY=/usr/sbin/policy-rc.d
POLICY_MARK="# made by ./dev while it installs packages"

# Services that come with the packages are not to start on this machine: Debian's own switch for that, unless somebody
# else has set it. One that a killed command left goes as well.
forbid_services() {
    ! grep -qsFx "$POLICY_MARK" "$POLICY" || rm -f -- "$POLICY"
    [[ ! -e $POLICY ]] || return 0
    { printf '#!/bin/sh\n%s\nexit 101\n' "$POLICY_MARK" >"$POLICY" && chmod 755 "$POLICY"; } ||
        die "$POLICY can't be written"
}

allow_services() {
    ! grep -qsFx "$POLICY_MARK" "$POLICY" || rm -f -- "$POLICY"
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
    local result=0
    forbid_services
    trap 'allow_services; interrupted' INT TERM
    step env DEBIAN_FRONTEND=noninteractive apt-get "${options[@]}" install -y --no-install-recommends \
        "${missing[@]}" || result=$?
    trap interrupted INT TERM
    allow_services
    ((result == 0)) || die "apt-get could not install the packages. The reason is above"
}
