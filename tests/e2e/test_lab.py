"""The lab does what it says: accounts, domains, trust, joins, and hosts that keep to themselves."""

import re
import time

import pytest

from lab import accounts, password

MEMBER = """[global]
	netbios name = {name}
	kerberos method = secrets and keytab
	idmap config * : backend = tdb
	idmap config * : range = 3000-7999
	winbind enum users = yes
	winbind enum groups = yes
	winbind scan trusted domains = yes
"""
AD = MEMBER + "\tsecurity = ads\n\tworkgroup = LAB\n\trealm = LAB.TEST\n"
NT4 = MEMBER + "\tsecurity = domain\n\tworkgroup = NT4DOM\n"
REALMS = {"LAB": "LAB.TEST", "OTHER": "OTHER.TEST"}
KERBEROS = {
    "administrator": (0, ""),
    "plain": (0, ""),
    "disabled": (1, "credentials have been revoked"),
    "expired": (1, "credentials have been revoked"),
    "locked": (1, "credentials have been revoked"),
    "must-change": (1, "Password expired"),
}
RPC = {
    "administrator": (0, "Domain Name: "),
    "plain": (0, "Domain Name: "),
    "disabled": (255, "NT_STATUS_ACCOUNT_DISABLED"),
    "expired": (255, "NT_STATUS_ACCOUNT_EXPIRED"),
    "locked": (255, "NT_STATUS_ACCOUNT_LOCKED_OUT"),
    "must-change": (255, "NT_STATUS_PASSWORD_MUST_CHANGE"),
}
CONTROLLERS = {"LAB": "dc1", "OTHER": "dc2", "NT4DOM": "pdc"}


def name_of(user):
    return f"{user['domain']}-{user['name']}"


def kinit(lab, host, principal, secret, *then):
    """Logs in with a cache of its own, and runs what else is to be done with the ticket."""
    script = 'trap "kdestroy -q" EXIT; export KRB5CCNAME=/tmp/cc.$$; kinit "$1" || exit 1; shift; [ $# = 0 ] || "$@"'
    return lab.exec(host, "bash", "-c", script, "kinit", principal, *then, input=secret + "\n", deadline=20)


def join(lab, host, tool, user, domain="LAB"):
    return lab.exec(host, "net", tool, "join", "-U", user, env={"PASSWD": password(domain, user)}, deadline=60)


@pytest.fixture(scope="module", autouse=True)
def fresh(lab):
    """The appliances as they came up, whatever the tests before have left on them."""
    for host in ("nas1", "nas2"):
        lab.must("renew", host)


@pytest.fixture
def member(lab):
    """Gives a host a configuration, and takes away afterwards what a join leaves on it."""
    used = []

    def configure(host, text):
        used.append(host)
        lab.write(host, "/etc/samba/smb.conf", text.format(name=host.upper()))
        return host

    yield configure
    for host in used:
        lab.exec(host, "sh", "-c", """
            [ ! -e /run/samba/winbindd.pid ] || kill "$(cat /run/samba/winbindd.pid)"
            net cache flush; rm -rf /var/lib/samba/* /etc/krb5.keytab; mkdir -m 700 /var/lib/samba/private""")


@pytest.mark.parametrize("user", [user for user in accounts() if user["domain"] in REALMS], ids=name_of)
def test_directory_users_log_in_or_fail_as_meant(lab, user):
    result = kinit(lab, "nas1", f"{user['name']}@{REALMS[user['domain']]}", user["password"])
    code, text = KERBEROS[user["state"]]
    assert result.code == code, result
    assert text in result.text, result


@pytest.mark.parametrize("user", accounts(), ids=name_of)
def test_users_log_in_by_rpc_or_fail_as_meant(lab, user):
    controller = lab.address(CONTROLLERS[user["domain"]])
    result = lab.exec("nas1", "net", "rpc", "info", "-S", controller, "-W", user["domain"], "-U", user["name"],
                      env={"PASSWD": user["password"]})
    code, text = RPC[user["state"]]
    assert result.code == code, result
    assert text in result.text, result


def test_the_trust_carries_a_user_of_the_other_forest(lab):
    result = kinit(lab, "nas1", "zed@OTHER.TEST", password("OTHER", "zed"), "kvno", "cifs/dc1.lab.test@LAB.TEST")
    assert result.code == 0, result
    assert "cifs/dc1.lab.test@LAB.TEST: kvno = " in result.out


def test_directory_join_and_leave(lab, member):
    nas = member("nas1", AD)
    joined = join(lab, nas, "ads", "Administrator")
    assert joined.code == 0 and "Joined 'NAS1' to dns domain 'lab.test'" in joined.out, joined
    tested = lab.exec(nas, "net", "ads", "testjoin")
    assert tested.code == 0 and "Join is OK" in tested.out, tested
    units = lab.exec(nas, "net", "ads", "search", "-P", "(objectClass=organizationalUnit)", "ou")
    assert {"ou: Büro Süd", "ou: Sales, West", "ou: Inner Unit"} <= set(units.out.splitlines()), units
    assert lab.exec(nas, "winbindd", "-D").code == 0
    deadline = time.monotonic() + 20
    while "OTHER\\zed" not in (users := lab.exec(nas, "wbinfo", "-u", "--domain=OTHER").out):
        assert time.monotonic() < deadline, users
        time.sleep(0.2)
    assert lab.exec(nas, "id", "LAB\\alice").code == 0
    left = lab.exec(nas, "net", "ads", "leave", "-U", "Administrator", env={"PASSWD": password("LAB", "Administrator")})
    assert left.code == 0, left


def test_nt4_join(lab, member):
    nas = member("nas2", NT4)
    joined = join(lab, nas, "rpc", "Administrator", "NT4DOM")
    assert joined.code == 0 and "Joined 'NAS2' to domain 'NT4DOM'" in joined.out, joined
    tested = lab.exec(nas, "net", "rpc", "testjoin")
    assert tested.code == 0 and "Join to 'NT4DOM' is OK" in tested.out, tested
    assert lab.exec(nas, "winbindd", "-D").code == 0
    listed = lab.exec(nas, "rpcclient", "-P", "-c", "querydispinfo", lab.address("pdc"))
    assert "Account: nina\tName: Nina Neumann" in listed.out, listed


@pytest.mark.parametrize("user", ["alice", "norights", "jörg"])
def test_who_has_no_right_can_not_join_the_directory(lab, member, user):
    result = join(lab, member("nas1", AD), "ads", user)
    assert result.code == 255 and "Insufficient access" in result.text, result
    found = lab.exec("dc1", "ldbsearch", "-H", "/var/lib/samba/private/sam.ldb", "(sAMAccountName=NAS1$)", "dn")
    assert "# 0 entries" in found.out, found


def test_who_has_no_right_can_not_join_nt4(lab, member):
    result = join(lab, member("nas2", NT4), "rpc", "nina", "NT4DOM")
    assert result.code == 255 and "{Access Denied}" in result.text, result


def test_names_that_do_not_exist_are_refused_at_once(lab):
    for server, answers in (("dc1", 1), ("switch", 1)):
        result = lab.exec("nas1", "dig", f"@{lab.address(server)}", "+tries=1", "+time=2", "nosuch.example")
        # As the question itself counts, without the start of the programs.
        took = re.search(r"Query time: (\d+) msec", result.out)
        assert "ANSWER: 0" in result.out and int(took[1]) < 1000, (answers, result)


def test_name_server_of_the_switch_knows_both_domains(lab):
    for realm, controller in (("lab.test", "dc1"), ("other.test", "dc2")):
        result = lab.exec("nas1", "dig", f"@{lab.address('switch')}", "+short", "SRV", f"_ldap._tcp.{realm}")
        assert result.out == f"0 100 389 {controller}.{realm}.\n", result


def test_what_a_host_writes_stays_in_it(lab, tmp_path):
    path = "/usr/share/lab-was-here"
    script = f"touch {path} /etc/lab-was-here /var/lib/lab-was-here /tmp/lab-was-here && rm /etc/passwd"
    try:
        assert lab.exec("nas1", "sh", "-c", script).code == 0
        for other in ("", "nas2"):
            for name in (path, "/etc/lab-was-here", "/var/lib/lab-was-here", "/tmp/lab-was-here"):
                assert lab.exec("nas2", "test", "-e", name).code == 1
                assert not tmp_path.joinpath(name).exists(), (other, name)
            assert lab.exec("nas2", "test", "-s", "/etc/passwd").code == 0
        with open("/etc/passwd", encoding="utf-8") as machine:
            assert "root:" in machine.read()
    finally:
        with open("/etc/passwd", encoding="utf-8") as machine:
            lab.write("nas1", "/etc/passwd", machine.read())
        lab.exec("nas1", "rm", "-f", path, "/etc/lab-was-here", "/var/lib/lab-was-here", "/tmp/lab-was-here")


def test_a_host_can_not_set_the_clock(lab):
    before = time.time()
    result = lab.exec("nas1", "date", "-s", "2001-01-01")
    assert result.code != 0 and "Operation not permitted" in result.err, result
    assert abs(time.time() - before) < 60


def test_a_host_sees_nothing_of_the_machine_s_life(lab):
    result = lab.exec("nas1", "ps", "-eo", "comm=")
    assert {"bash", "busybox", "cron"} <= set(result.out.split()) and "pytest" not in result.out, result
    assert lab.exec("nas1", "ls", "/var/spool/cron/crontabs", "/etc/cron.d").out.split("\n")[1] == ""
    links = lab.exec("nas1", "ip", "-o", "link").out
    assert len(links.splitlines()) == 2 and " lo: " in links and " eth0@" in links


def test_extended_attributes_and_acls_work(lab):
    script = """cd /var/lib/samba && touch f &&
        setfattr -n security.NTACL -v 0sAAEC f && getfattr -n security.NTACL f &&
        setfacl -m u:nobody:r f && getfacl f; rm -f f"""
    result = lab.exec("nas1", "sh", "-c", script)
    assert 'security.NTACL=0sAAEC' in result.out and "user:nobody:r--" in result.out, result


def test_exec_passes_on_input_environment_and_exit_code(lab):
    result = lab.exec("nas1", "sh", "-c", 'pwd; cat; echo "$WORD" >&2; exit 7', input="ünï\n", env={"WORD": "given"})
    assert (result.code, result.out, result.err) == (7, "/\nünï\n", "given\n")
    assert lab.exec("nas1", "sh", "-c", "kill -9 $$").code == -9


def test_a_command_ends_with_the_one_who_runs_it(lab):
    with pytest.raises(Exception, match="did not end within 1 s"):
        lab.exec("nas1", "sleep", "4711", deadline=1)
    deadline = time.monotonic() + 5
    while "4711" in lab.exec("nas1", "ps", "-eo", "args=").out:
        assert time.monotonic() < deadline
        time.sleep(0.1)


def test_system_log_is_received(lab):
    assert lab.exec("nas1", "logger", "-t", "test", "a line of the test").code == 0
    deadline = time.monotonic() + 10
    while not re.search(r"nas1 .*test: a line of the test", lab.exec("nas1", "cat", "/var/log/syslog").out):
        assert time.monotonic() < deadline
        time.sleep(0.1)


def test_cron_runs_tables(lab):
    lab.write("nas2", "/etc/cron.d/lab-test", "* * * * * root touch /tmp/cron-ran\n")
    try:
        deadline = time.monotonic() + 130
        while lab.exec("nas2", "test", "-e", "/tmp/cron-ran").code != 0:
            assert time.monotonic() < deadline
            time.sleep(1)
    finally:
        lab.exec("nas2", "rm", "-f", "/etc/cron.d/lab-test", "/tmp/cron-ran")


def test_dns_points_elsewhere(lab):
    try:
        lab.must("dns", "nas2", "dc2", "192.0.2.1")
        text = lab.exec("nas2", "cat", "/etc/resolv.conf").out
        assert text.splitlines()[:2] == ["nameserver 10.77.0.30", "nameserver 192.0.2.1"]
    finally:
        lab.must("dns", "nas2", "dc1")


def test_status_and_users_tell_all(lab):
    status = lab.must("status").out
    assert all(host in status for host in ("dc1", "dc2", "pdc", "nas1", "nas2"))
    controllers = [line for line in status.splitlines() if line.startswith(("dc1", "dc2", "pdc"))]
    assert len(controllers) == 3 and all(line.endswith("running") for line in controllers), status
    users = lab.must("users").out
    assert all(user["name"] in users and user["password"] in users for user in accounts())
