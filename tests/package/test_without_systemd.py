"""Installing where no systemd runs, as in a container: the same files, no service, and after all that no trace."""

import pytest

from machine import Machine, processes_of, until
from snapshot import differences, named, snapshot

MACHINE = "plain"
NAMES = ["vorn-console", "vorn-appliance", "vorn-directory-domain"]


@pytest.fixture
def plain(ready_root, space, request):
    with Machine(ready_root, space / request.node.name, "plain") as machine:
        machine.put()
        yield machine


def start_servers(machine):
    machine.start("/usr/vorn/sbin/vornd")
    until(lambda: machine.run("vornctl", "status").code == 0, 30, "vornd answers")
    machine.must("install", "-d", "-m", "700", "-o", "vorn-httpd", "-g", "vorn-httpd", "/var/lib/vorn-httpd")
    machine.start("setpriv", "--reuid=vorn-httpd", "--regid=vorn-httpd", "--clear-groups", "--no-new-privs",
                  "/usr/vorn/sbin/vorn-httpd")
    until(lambda: machine.curl("https://127.0.0.1:8443/healthz").code == 0, 30, "vorn-httpd answers")


def test_a_whole_life_leaves_no_trace(plain, packages):
    before = snapshot(plain)
    plain.install(*packages.values())
    start_servers(plain)
    assert "member" in plain.must("vornctl", "status")
    page = plain.curl("--fail", "https://127.0.0.1:8443/")
    assert page.code == 0 and plain.path("/usr/vorn/share/console/index.html").read_text(encoding="utf-8") == page.text
    plain.must("vornctl", "options", "--sync-time", "on")
    assert "vornwin" in plain.path("/etc/cron.d/vorn").read_text(encoding="utf-8")
    # vornd has started it, since nothing else does here.
    assert "/usr/sbin/smbd" in processes_of(plain, "/usr/sbin/")
    # What a refresh or a join that was killed may leave.
    plain.must("touch", "/tmp/domain_updating", "/tmp/domain_user.pid", "/tmp/domain_group.pid", "/var/log/winlock.state",
               "/etc/.vorninfo.conf.vorn-aB3dE6", "/etc/cron.d/.vorn.vorn-aB3dE6", "/var/lib/vorn/tasks.db.damaged")

    plain.apt("remove", *NAMES)
    assert processes_of(plain, "/usr/vorn/") == []
    assert processes_of(plain, "/usr/sbin/") == []
    assert not plain.path("/etc/cron.d/vorn").exists()
    assert plain.path("/usr/vorn/etc/smb.conf").exists()
    assert plain.path("/etc/vorninfo.conf").exists()

    plain.apt("purge", *NAMES)
    plain.must("rm", "-r", "/opt/packages")
    plain.must("mkdir", "/opt/packages")
    after = snapshot(plain)
    assert differences(before, after) == []
    assert named(after, "vorn") == []
    for path in ("/run", "/tmp"):
        assert [entry.name for entry in plain.path(path).iterdir() if "vorn" in entry.name or "domain" in entry.name] == []
    assert "vorn" not in plain.must("dpkg-query", "--show", "--showformat", "${Package} ${db:Status-Status}\n")


def test_accounts_that_were_there_before_stay(plain, packages):
    plain.must("groupadd", "--system", "administrators")
    plain.must("useradd", "--no-create-home", "--groups", "administrators", "alice")
    entry = plain.must("getent", "group", "administrators")
    plain.install(*packages.values())
    assert plain.must("getent", "group", "administrators") == entry
    plain.apt("purge", *NAMES)
    assert plain.must("getent", "group", "administrators") == entry
    assert plain.run("getent", "passwd", "vorn-httpd").code == 2
    assert plain.run("getent", "group", "vorn-httpd").code == 2


def test_accounts_go_also_when_the_purge_comes_after_a_second_installation(plain, packages):
    plain.install(*packages.values())
    plain.apt("remove", *NAMES)
    plain.install(*packages.values())
    plain.apt("purge", *NAMES)
    assert plain.run("getent", "group", "administrators").code == 2
    assert plain.run("getent", "passwd", "vorn-httpd").code == 2


def test_removing_a_member_says_what_stays_in_the_domain(plain, packages):
    plain.install(*packages.values())
    assert "computer account" not in plain.apt("remove", "vorn-appliance")
    plain.install(*packages.values())
    conf = plain.path("/usr/vorn/etc/smb.conf")
    text = conf.read_text(encoding="utf-8").replace("workgroup = WORKGROUP", "workgroup = LAB\n    realm = LAB.TEST")
    conf.write_text(text.replace("security = user", "security = ads"), encoding="utf-8")
    lines = [line for line in plain.apt("remove", "vorn-appliance").splitlines() if line.startswith("vorn-appliance:")]
    assert len(lines) == 1, lines
    assert "member of LAB;" in lines[0] and "computer account stays" in lines[0] and "vornctl leave" in lines[0]


def test_purging_the_appliance_leaves_the_module(plain, packages):
    plain.install(*packages.values())
    plain.apt("purge", "vorn-console", "vorn-appliance")
    assert [path for path in sorted(snapshot(plain)) if path.startswith("/usr/vorn/")] == [
        "/usr/vorn/lib", "/usr/vorn/lib/modules", "/usr/vorn/lib/modules/vorn_directory_domain.so"]
    plain.apt("purge", "vorn-directory-domain")
    assert not plain.path("/usr/vorn").exists()


def test_a_removal_waits_for_a_join_and_ends_what_can_be_ended(plain, packages):
    plain.install(*packages.values())
    # Programs of the same paths that take their time.
    plain.must("cp", "/usr/bin/sleep", "/usr/vorn/sbin/vornjoin")
    plain.must("cp", "/usr/bin/sleep", "/usr/vorn/sbin/vornwin")
    plain.start("/usr/vorn/sbin/vornjoin", "10")
    plain.start("/usr/vorn/sbin/vornwin", "300")
    # One of a container on this machine is none of its.
    plain.start("unshare", "--pid", "--fork", "--kill-child", "/usr/vorn/sbin/vornwin", "301")
    until(lambda: len(processes_of(plain, "/usr/vorn/")) == 3, 10, "the programs run")
    text = plain.apt("remove", "vorn-appliance")
    assert "waiting for the end of a join" in text
    left = processes_of(plain, "/usr/vorn/")
    assert left == ["/usr/vorn/sbin/vornwin (deleted)"], left


def test_the_page_alone_is_refused_and_nothing_happens(options, packages, space):
    with Machine(options.bare_root, space / "bare", "plain") as bare:
        places = bare.put(packages["vorn-console"])
        before = snapshot(bare)
        refused = bare.run("apt-get", "-q", "install", "-y", "--no-install-recommends", *places)
        assert refused.code == 100 and "Depends: vorn-appliance (= " in refused.text, refused
        assert differences(before, snapshot(bare)) == []
        # dpkg looks at dependencies later: the files lie there, and that is all.
        forced = bare.run("dpkg", "--install", *places)
        assert forced.code == 1 and "dependency problems" in forced.text, forced
        bare.must("dpkg", "--purge", "vorn-console")
        assert differences(before, snapshot(bare)) == []
