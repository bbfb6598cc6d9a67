# The controller of the NT4-style domain, pdc.
# shellcheck shell=bash disable=SC2016 # words in single quotes are expanded inside the host

make_nt4() {
    local archive address users
    address=$(address_of pdc)
    # The archive holds the accounts of the system, too.
    users=$(cat /etc/passwd /etc/group | sha256sum)
    archive=$(archive_name pdc accounts.conf lib/nt4.sh lib/nt4_inside.sh -- "$address" "$users")
    printf '127.0.0.1 localhost\n%s pdc\n' "$address" | write_file pdc /etc/hosts
    point_dns pdc "$GATEWAY"
    if restore pdc "$archive"; then
        report "pdc: domain restored from the cache"
        return
    fi
    write_file pdc /etc/samba/smb.conf <<'TEXT'
[global]
	workgroup = NT4DOM
	netbios name = PDC
	security = user
	server role = classic primary domain controller
	domain logons = yes
	domain master = yes
	preferred master = yes
	local master = yes
	os level = 65
	wins support = yes
	passdb backend = tdbsam
	add machine script = /usr/sbin/useradd -d /nonexistent -s /usr/sbin/nologin -c machine -M %u
	interfaces = lo eth0
	bind interfaces only = yes
	load printers = no
	disable spoolss = yes
TEXT
    inside pdc bash -c "$(<"$LAB_HOME/lib/nt4_inside.sh")" nt4 NT4DOM <"$LAB_HOME/accounts.conf" \
        >"$STATE/pdc.accounts.log" 2>&1 ||
        die_with "$STATE/pdc.accounts.log" "the accounts of pdc could not be made"
    report "pdc: domain and users made"
    keep pdc "$archive" /var/lib/samba /etc/samba/smb.conf /etc/passwd /etc/shadow /etc/group /etc/gshadow
}

start_nt4() {
    start_daemon pdc "$STATE/pdc.log" nmbd -F --no-process-group --debug-stdout
    start_daemon pdc "$STATE/pdc.log" smbd -F --no-process-group --debug-stdout
}

# nmbd takes a few seconds to become the domain's master; members find it by these names, which they call out.
nt4_answers() {
    inside "$SWITCH" bash -c 'exec 3<>"/dev/tcp/$1/445" && exec 3>&- || exit 1
        for name in "NT4DOM#1C" "NT4DOM#1B"; do
            nmblookup --configfile=/dev/null -B 10.77.0.255 "$name" | grep -q "^$1 " || exit 1
        done' answers "$(address_of pdc)" >/dev/null 2>&1
}

await_nt4() {
    daemon_answers 120 nt4_answers || die_with "$STATE/pdc.log" "the controller pdc does not answer"
    report "pdc: controller answers"
}
