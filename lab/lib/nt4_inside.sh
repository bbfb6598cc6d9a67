# Makes the groups and users of the NT4-style domain; runs inside its controller: nt4_inside.sh DOMAIN <accounts.conf
# shellcheck shell=bash
set -euo pipefail

trimmed() {
    local text=$1
    text=${text#"${text%%[![:space:]]*}"}
    printf '%s' "${text%"${text##*[![:space:]]}"}"
}

add_group() {
    groupadd -- "$1"
    net groupmap add ntgroup="$1" unixgroup="$1" type=domain comment="$2"
}

add_user() {
    local user=$1 password=$2 state=$3 display=$4 groups=$5 group
    # Who is in "Domain Users" is told by the primary group.
    useradd --no-create-home --home-dir /nonexistent --shell /usr/sbin/nologin --gid domusers --comment "$display" -- \
        "$user"
    printf '%s\n%s\n' "$password" "$password" | smbpasswd -s -a "$user"
    pdbedit --modify --user="$user" --fullname="$display"
    while IFS= read -r group; do
        [[ $group != "Domain Admins" ]] || group=domadmins
        [[ -z $group ]] || usermod --append --groups "$group" -- "$user"
    done < <(tr ';' '\n' <<<"$groups")
    case $state in
        administrator | plain) ;;
        disabled) smbpasswd -d "$user" ;;
        must-change) net sam set pwdmustchangenow "$user" yes ;;
        locked) pdbedit --modify --user="$user" --account-control='[L]' ;;
        *)
            printf 'there is no state "%s"\n' "$state" >&2
            exit 1
            ;;
    esac
}

groupadd domadmins
groupadd domusers
groupadd domguests
net groupmap add rid=512 ntgroup="Domain Admins" unixgroup=domadmins type=domain
net groupmap add rid=513 ntgroup="Domain Users" unixgroup=domusers type=domain
net groupmap add rid=514 ntgroup="Domain Guests" unixgroup=domguests type=domain
# Domain names of users are read without regard to case, names of the system are not.
while IFS='|' read -r kind domain name one two three four _; do
    [[ $(trimmed "${domain:-}") == "$1" ]] || continue
    name=$(trimmed "$name")
    case $(trimmed "$kind") in
        group) add_group "$name" "$(trimmed "$one")" ;;
        user) add_user "${name,,}" "$(trimmed "$one")" "$(trimmed "$two")" "$(trimmed "$three")" "$(trimmed "$four")" ;;
    esac
done
