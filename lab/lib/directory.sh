# The controllers of Active Directory, dc1 and dc2.
# shellcheck shell=bash disable=SC2016 # words in single quotes are expanded inside the host

BULK=0

# password_of DOMAIN USER: as accounts.conf says.
password_of() {
    awk -F '|' -v domain="$1" -v user="$2" '
        { for (i = 1; i <= NF; i++) gsub(/^[ \t]+|[ \t]+$/, "", $i) }
        $1 == "user" && $2 == domain && $3 == user { print $4 }' "$LAB_HOME/accounts.conf"
}

# name_controller HOST: a controller finds itself and its domain by name.
name_controller() {
    local host=$1 realm
    realm=$(realm_of "$host")
    printf '127.0.0.1 localhost\n%s %s.%s %s\n' "$(address_of "$host")" "$host" "${realm,,}" "$host" |
        write_file "$host" /etc/hosts
    printf 'search %s\nnameserver %s\noptions timeout:1 attempts:2\n' "${realm,,}" "$(address_of "$host")" |
        write_file "$host" /etc/resolv.conf
    printf '%s\n' '[libdefaults]' "default_realm = $realm" 'dns_lookup_realm = false' 'dns_lookup_kdc = true' \
        'rdns = false' | write_file "$host" /etc/krb5.conf
}

# make_directory HOST: the domain's data, from the cache or anew. A controller with many users stands on one without.
make_directory() {
    local host=$1 bulk=0 base archive
    local kept=(/var/lib/samba /etc/samba/smb.conf)
    [[ $host != dc1 ]] || bulk=$BULK
    name_controller "$host"
    local made_by=(accounts.conf accounts.py lib/directory.sh)
    base=$(archive_name "$host" "${made_by[@]}" -- "$(address_of "$host")" "$GATEWAY")
    archive=$base
    if ((bulk > 0)); then
        archive=$(archive_name "$host-$bulk" "${made_by[@]}" bulk.py -- "$(address_of "$host")" "$GATEWAY")
        if restore "$host" "$archive"; then
            report "$host: domain with $bulk users restored from the cache"
            return
        fi
    fi
    if restore "$host" "$base"; then
        report "$host: domain restored from the cache"
    else
        provision "$host"
        report "$host: domain provisioned"
        make_accounts "$host"
        report "$host: users, groups and units made"
        keep "$host" "$base" "${kept[@]}"
    fi
    if ((bulk > 0)); then
        inside "$host" python3 -c "$(<"$LAB_HOME/bulk.py")" "$bulk" 1000 </dev/null >"$STATE/$host.bulk.log" 2>&1 ||
            die_with "$STATE/$host.bulk.log" "the many users of $host could not be made"
        report "$host: $bulk users and 1000 groups added"
        keep "$host" "$archive" "${kept[@]}"
    fi
}

provision() {
    local host=$1 log=$STATE/$1.provision.log
    # The administrator's password is a random one until make_accounts sets it.
    inside "$host" sh -c 'rm -f /etc/samba/smb.conf
        exec samba-tool domain provision --realm="$1" --domain="$2" --host-name="$3" --host-ip="$4" --server-role=dc \
            --dns-backend=SAMBA_INTERNAL --use-rfc2307 --option="interfaces=lo eth0" \
            --option="bind interfaces only=yes"' \
        provision "$(realm_of "$host")" "$(domain_of "$host")" "$host" "$(address_of "$host")" \
        >"$log" 2>&1 </dev/null || die_with "$log" "the domain of $host could not be provisioned"
    # Without TLS, NetBIOS and printing it starts faster; names that it doesn't know go to the
    # name server at the switch, which a trust needs.
    inside "$host" sh -c 'sed -i -e "/dns forwarder/d" -e "/\[global\]/a\\
\tdns forwarder = $1\\
\ttls enabled = no\\
\tprefork children = 1\\
\tserver services = -nbt, -wrepl\\
\tdisable netbios = yes\\
\tload printers = no\\
\tdisable spoolss = yes" /etc/samba/smb.conf' smb "$GATEWAY" >>"$log" 2>&1 ||
        die_with "$log" "smb.conf of $host could not be written"
}

make_accounts() {
    local host=$1
    inside "$host" python3 -c "$(<"$LAB_HOME/accounts.py")" "$(domain_of "$host")" <"$LAB_HOME/accounts.conf" \
        >"$STATE/$host.accounts.log" 2>&1 ||
        die_with "$STATE/$host.accounts.log" "the accounts of $host could not be made"
}

start_directory() {
    start_daemon "$1" "$STATE/$1.log" samba -F --no-process-group --debug-stdout
}

# directory_answers HOST: all that a member needs of it.
directory_answers() {
    local host=$1 realm
    realm=$(realm_of "$host")
    inside "$host" bash -c '
        dig +short +time=1 +tries=1 -t SRV "_ldap._tcp.dc._msdcs.$1" "@$2" | grep -q "^0 100 389 $3\." || exit 1
        for port in 88 135 389 445 464; do
            exec 3<>"/dev/tcp/$2/$port" || exit 1
            exec 3>&-
        done' answers "${realm,,}" "$(address_of "$host")" "$host" >/dev/null 2>&1
}

await_directory() {
    daemon_answers 120 directory_answers "$1" || die_with "$STATE/$1.log" "the controller $1 does not answer"
    report "$1: controller answers"
}

# Two wrong passwords lock the account, which only a running controller can do.
lock_accounts() {
    local i
    for i in 1 2 3; do
        inside dc1 sh -c 'echo "wrong.$1" | KRB5CCNAME=MEMORY: kinit locked1@LAB.TEST' lock "$i" >/dev/null 2>&1 || true
    done
    password_of LAB locked1 | inside dc1 env KRB5CCNAME=MEMORY: kinit locked1@LAB.TEST >"$STATE/lock.log" 2>&1 &&
        die "locked1 could not be locked"
    grep -q revoked "$STATE/lock.log" || die_with "$STATE/lock.log" "locked1 could not be locked"
}

make_trust() {
    local i
    for i in 1 2 3 4 5; do
        password_of OTHER Administrator | inside dc1 sh -c 'read -r PASSWD && export PASSWD &&
            exec samba-tool domain trust create OTHER.TEST --type=forest --direction=both --create-location=both \
                -U Administrator@OTHER.TEST' >"$STATE/trust.log" 2>&1 && grep -q '^Success' "$STATE/trust.log" && break
        sleep 0.5
    done
    grep -q '^Success' "$STATE/trust.log" || die_with "$STATE/trust.log" "the forest trust could not be made"
    report "two-way forest trust LAB.TEST <-> OTHER.TEST made"
}
