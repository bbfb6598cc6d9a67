# ./dev lab: real domain controllers, and appliances beside them.
# shellcheck shell=bash

# shellcheck source=dev.d/packages.sh
. "$ROOT/dev.d/packages.sh"

usage() {
    cat <<'TEXT'
usage: ./dev lab COMMAND [ARGUMENT...]

Brings up two domains of Active Directory, an NT4-style domain and appliances, each in namespaces of its own on this
machine, and takes them down again. "up" installs the packages that are missing; their services don't start.

TEXT
    "$ROOT/lab/lab" --help | sed 's/^/  /'
}

main() {
    case ${1:-} in
        '' | -h | --help)
            usage
            return
            ;;
        up)
            ((EUID == 0)) || die "only root can bring up a lab"
            start_log
            need_packages "${LAB_PACKAGES[@]}"
            ;;
    esac
    exec "$ROOT/lab/lab" "$@"
}
