"""How labs come and go: side by side, killed half-way, with the process that asked for them, and without a trace."""

import contextlib
import os
import pathlib
import re
import signal
import subprocess
import sys
import time

import pytest

from lab import COMMAND, Lab, password, run

BARE = ("--no-ad", "--appliances", "nas7")  # up within a second
SMALL = (*BARE, "--nt4")  # up within a few seconds
HELD = []  # descriptors


def machine():
    """What a lab might leave behind on this machine, apart from processes."""
    mounts = pathlib.Path("/proc/self/mountinfo").read_text(encoding="utf-8").splitlines()
    links = subprocess.run(["ip", "-o", "link"], capture_output=True, text=True, check=True).stdout
    return {
        "mounts": sorted(re.sub(r"^\d+ \d+ ", "", line) for line in mounts),
        "links": sorted(re.findall(r"^\d+: ([^:@]+)", links, re.M)),
        "samba": [sorted(os.listdir(folder)) for folder in ("/etc/samba", "/var/lib/samba", "/run") if
                  os.path.isdir(folder)],
        "resolv.conf": pathlib.Path("/etc/resolv.conf").read_bytes(),
        "passwd": pathlib.Path("/etc/passwd").read_bytes(),
    }


def namespaces(lab):
    """The networks of a lab's hosts. They are held until the test ends: else the number of one that is gone could be
    that of another lab's host a moment later."""
    for path in lab.folder.glob("hosts/*/init"):
        # A host that is half made or has ended has none.
        with contextlib.suppress(FileNotFoundError, ProcessLookupError, IndexError):
            HELD.append(os.open(f"/proc/{path.read_text().split()[0]}/ns/net", os.O_RDONLY))
    return {path.read_text().strip() for path in lab.folder.glob("hosts/*/network")}


def processes(lab, networks=()):
    """Processes of this machine that are in one of the lab's hosts, or name its folder."""
    found = []
    for folder in pathlib.Path("/proc").glob("[1-9]*"):
        try:
            words = (folder / "cmdline").read_bytes().replace(b"\0", b" ").decode(errors="replace")
            if os.readlink(folder / "ns" / "net") in networks or f"{lab.folder}" in words:
                found.append(f"{folder.name} {words}")
        except OSError:
            continue
    return [process for process in found if int(process.split()[0]) != os.getpid()]


def gone(lab, networks, seconds=15):
    deadline = time.monotonic() + seconds
    while lab.folder.exists() or processes(lab, networks):
        assert time.monotonic() < deadline, processes(lab, networks)
        time.sleep(0.05)


@pytest.fixture
def cache(tmp_path_factory):
    """One cache for all tests of this file; each controller is made once."""
    folder = tmp_path_factory.getbasetemp() / "lab-cache"
    return folder


@pytest.fixture
def make(tmp_path, cache):
    made = []

    def make_one(name, its_cache=cache):
        made.append(Lab(tmp_path / name, its_cache))
        return made[-1]

    yield make_one
    for lab in made:
        lab.down()
    while HELD:
        os.close(HELD.pop())


def test_up_and_down_leave_no_trace(make):
    before = machine()
    lab = make("a")
    result = lab.up(*SMALL)
    assert result.out.splitlines()[-1].endswith("ok: the lab is up: nas7 pdc"), result
    networks = namespaces(lab)
    assert len(networks) == 3 and processes(lab, networks)
    assert lab.down().out.rstrip().endswith("ok: the lab is gone")
    gone(lab, networks, 0)
    assert machine() == before
    again = lab.down()
    assert again.out.startswith("ok: there is no lab in ")


def test_up_takes_the_old_one_down_first(make):
    lab = make("a")
    lab.up(*SMALL)
    lab.write("nas7", "/root/old", "x")
    old = {path.read_text() for path in lab.folder.glob("hosts/*/init")}
    lab.up("--no-ad", "--appliances", "nas7,nas8")
    assert lab.exec("nas7", "test", "-e", "/root/old").code == 1
    assert not (lab.folder / "hosts" / "pdc").exists()
    for record in old:
        pid, start = record.split()
        with contextlib.suppress(FileNotFoundError, ProcessLookupError):
            fields = pathlib.Path(f"/proc/{pid}/stat").read_text().rsplit(")", 1)[1].split()
            assert fields[0] == "Z" or fields[19] != start, record


def test_a_lab_that_is_up_can_be_spared(make):
    lab = make("a")
    lab.up(*BARE)
    result = lab.command("up", "--only-new", *BARE)
    assert result.code == 1 and result.err == f"lab: a lab is up already in {lab.folder}\n", result
    assert lab.exec("nas7", "true").code == 0
    lab.down()
    lab.must("up", "--only-new", *BARE)


@pytest.mark.parametrize("victim", ["hosts/switch/init", "hosts/switch/holder", "hosts/nas7/init", "hosts/pdc/holder",
                                    "watchdog"])
def test_down_after_something_was_killed(make, victim):
    before = machine()
    lab = make("a")
    lab.up(*SMALL)
    networks = namespaces(lab)
    os.kill(int((lab.folder / victim).read_text().split()[0]), signal.SIGKILL)
    time.sleep(0.2)
    if victim.endswith("nas7/init"):
        # With it end the other processes of the host first.
        deadline = time.monotonic() + 10
        while not re.search(r"^nas7 .* down$", (status := lab.must("status").out), re.M):
            assert time.monotonic() < deadline, status
            time.sleep(0.05)
        assert lab.exec("nas7", "true").err == "lab: the host nas7 is down\n"
    lab.down()
    gone(lab, networks, 0)
    assert machine() == before


@pytest.mark.parametrize("seconds", [0.05, 0.1, 0.2, 0.4, 0.6, 0.8, 1.0, 1.3])
def test_up_killed_half_way(make, seconds):
    before = machine()
    lab = make("a")
    # A caller that is killed with the command, so that only "down" is left to clean up.
    up = subprocess.Popen([COMMAND, "up", *SMALL], env={**os.environ, **lab.env}, stdout=subprocess.DEVNULL,
                          stderr=subprocess.DEVNULL, start_new_session=True)
    time.sleep(seconds)
    up.kill()
    up.wait()
    networks = namespaces(lab)
    lab.down()
    gone(lab, networks)
    assert machine() == before


@pytest.mark.parametrize("seconds", [0.3, 0.7, 1.0])
def test_interrupted_up_takes_itself_down(make, seconds):
    lab = make("a")
    up = subprocess.Popen([COMMAND, "up", *SMALL], env={**os.environ, **lab.env}, stdout=subprocess.PIPE,
                          stderr=subprocess.PIPE, text=True, start_new_session=True)
    end = time.monotonic() + seconds
    # Earlier there is nothing to take down.
    deadline = time.monotonic() + 20
    while not (lab.folder / "up").exists():
        assert time.monotonic() < deadline
        time.sleep(0.02)
    time.sleep(max(0, end - time.monotonic()))
    networks = namespaces(lab)
    os.killpg(up.pid, signal.SIGINT)
    _, err = up.communicate(timeout=30)
    assert up.returncode == 130 and "nothing of it is left" in err, (up.returncode, err)
    gone(lab, networks, 5)  # what waited for a host's process hears of its end a moment later


def test_down_ends_an_up_that_is_under_way(make, tmp_path):
    before = machine()
    lab = make("a", tmp_path / "empty-cache")
    up = subprocess.Popen([COMMAND, "up"], env={**os.environ, **lab.env}, stdout=subprocess.DEVNULL,
                          stderr=subprocess.DEVNULL, start_new_session=True)
    deadline = time.monotonic() + 20
    while not (lab.folder / "dc1.provision.log").exists():
        assert time.monotonic() < deadline
        time.sleep(0.02)
    networks = namespaces(lab)
    assert lab.down().seconds < 10
    up.wait(timeout=10)
    gone(lab, networks, 5)  # the killed command's own helpers hear of it a moment later
    assert machine() == before
    assert list((tmp_path / "empty-cache").glob("*.tar")) == []


def test_a_lab_ends_with_the_process_that_asked_for_it(make):
    lab = make("a")
    owner = subprocess.Popen([sys.executable, "-c", "import time; time.sleep(1000)"])
    lab.must("up", "--with-pid", owner.pid, *BARE)
    networks = namespaces(lab)
    owner.kill()
    owner.wait()
    gone(lab, networks)


def test_a_stopped_visitor_does_not_keep_a_lab(make):
    lab = make("a")
    lab.up(*BARE)
    networks = namespaces(lab)
    visitor = subprocess.Popen([COMMAND, "exec", "nas7", "sh", "-c", "kill -STOP $$; sleep 100"],
                               env={**os.environ, **lab.env}, start_new_session=True)
    time.sleep(0.5)
    assert lab.down().seconds < 10
    visitor.wait(timeout=10)
    gone(lab, networks, 0)


def test_two_labs_at_once_know_nothing_of_each_other(make):
    first, second = make("first"), make("second")
    for lab in (first, second):
        lab.up(*SMALL)
        lab.write("nas7", "/etc/samba/smb.conf",
                  f"[global]\n\tworkgroup = NT4DOM\n\tsecurity = domain\n\tnetbios name = {lab.folder.name}\n")
    joined = first.exec("nas7", "net", "rpc", "join", "-U", "administrator",
                        env={"PASSWD": password("NT4DOM", "Administrator")})
    assert joined.code == 0, joined
    lists = {lab.folder.name: lab.exec("pdc", "pdbedit", "--list").out for lab in (first, second)}
    assert "first$" in lists["first"] and "first$" not in lists["second"]
    first.down()
    assert second.exec("nas7", "true").code == 0
    assert "NT4DOM running" in second.must("status").out


def test_two_labs_that_come_up_at_once_share_a_cache(make, tmp_path):
    cache = tmp_path / "cache"
    labs = [make(name, cache) for name in ("first", "second")]
    ups = [subprocess.Popen([COMMAND, "up", *SMALL], env={**os.environ, **lab.env}, stdout=subprocess.PIPE,
                            stderr=subprocess.STDOUT, text=True) for lab in labs]
    for up in ups:
        out, _ = up.communicate(timeout=120)
        assert up.returncode == 0, out
    assert [path.suffix for path in cache.iterdir()] == [".tar"]
    assert cache.stat().st_mode & 0o77 == 0
    # The next one takes it from there; one that is damaged is made anew.
    assert "restored from the cache" in labs[0].up(*SMALL).out
    archive, = cache.iterdir()
    whole = archive.stat().st_size
    os.truncate(archive, whole // 2)
    assert "pdc: domain and users made" in labs[0].up(*SMALL).out
    assert archive.stat().st_size > whole // 2


def test_a_cache_that_can_not_be_written_costs_time_only(make, tmp_path):
    blocked = tmp_path / "file"
    blocked.write_text("no folder")
    result = make("a", blocked / "cache").up(*SMALL)
    assert "nothing can be kept" in result.out, result


def test_shared_folders_are_seen_and_written_by_all(make, tmp_path):
    shared = tmp_path / "shared"
    shared.mkdir()
    (shared / "in").write_text("from the machine\n")
    lab = make("a")
    lab.up(*SMALL, "--share", shared)
    assert lab.exec("nas7", "cat", shared / "in").out == "from the machine\n"
    assert lab.exec("pdc", "sh", "-c", f"echo from pdc >{shared}/out").code == 0
    assert (shared / "out").read_text() == "from pdc\n"


def test_each_appliance_gets_its_own_copy_of_the_stage(make, tmp_path):
    stage = tmp_path / "stage"
    (stage / "usr/vorn/bin").mkdir(parents=True)
    (stage / "lib/systemd").mkdir(parents=True)  # /lib is a link on Debian, and stays one
    (stage / "lib/systemd/of-the-stage").write_text("x")
    program = stage / "usr/vorn/bin/hello"
    program.write_text("#!/bin/sh\necho hello\n")
    program.chmod(0o755)
    lab = make("a")
    lab.up("--no-ad", "--appliances", "nas7,nas8", "--stage", stage)
    assert lab.exec("nas7", "/usr/vorn/bin/hello").out == "hello\n"
    assert lab.exec("nas7", "sh", "-c", "echo echo changed >/usr/vorn/bin/hello; test -L /lib").code == 0
    assert lab.exec("nas7", "test", "-e", "/usr/lib/systemd/of-the-stage").code == 0
    assert lab.exec("nas8", "/usr/vorn/bin/hello").out == "hello\n"
    program.write_text("#!/bin/sh\necho newer\n")
    lab.must("stage", stage)
    assert [lab.exec(host, "/usr/vorn/bin/hello").out for host in ("nas7", "nas8")] == ["newer\n", "newer\n"]
    assert lab.command("vornd", "nas7", "start").code == 1


BULK = ("sh", "-c", "ldbsearch -H /var/lib/samba/private/sam.ldb '(sAMAccountName=bulk*)' dn | grep -c '^dn: CN=bulk'")


def test_many_users(make, tmp_path):
    before = machine()
    lab = make("a")
    made = lab.up("--bulk", "2000", "--appliances", "nas7").out
    assert "dc1: 2000 users and 1000 groups added" in made and "2000 users restored" not in made, made
    lab.write("nas7", "/etc/samba/smb.conf",
              "[global]\n\tworkgroup = LAB\n\trealm = LAB.TEST\n\tsecurity = ads\n\tnetbios name = NAS7\n")
    found = lab.exec("nas7", "net", "ads", "search", "(&(sAMAccountType=805306368)(sAMAccountName=bulk*))",
                     "sAMAccountName", "objectSid", "memberOf", "-U", "LAB/alice",
                     env={"PASSWD": password("LAB", "alice")})
    assert found.out.count("sAMAccountName: bulk") == 2000, found
    assert len(set(re.findall(r"objectSid: (\S+)", found.out))) == 2000
    assert found.out.count("memberOf: CN=bulkgroup") == 20 * 1000
    groups = lab.exec("nas7", "net", "ads", "search", "(&(objectClass=group)(cn=bulkgroup*))", "cn", "-U", "LAB/alice",
                      env={"PASSWD": password("LAB", "alice")})
    assert groups.out.count("cn: bulkgroup") == 1000
    lab.must("kill-dc", "dc1")
    checked = lab.exec("dc1", "samba-tool", "dbcheck", deadline=120)
    assert checked.code == 0 and re.search(r"Checked \d+ objects \(0 errors\)", checked.out), checked
    count = lab.exec("dc1", *BULK).out
    # The second time they come from the cache, and they are the same.
    again = lab.up("--bulk", "2000", "--appliances", "nas7").out
    assert "dc1: domain with 2000 users restored from the cache" in again and "added" not in again, again
    assert lab.exec("dc1", *BULK).out == count and int(count) >= 3000
    networks = namespaces(lab)
    assert len(networks) == 3 and processes(lab, networks)
    lab.down()
    gone(lab, networks)
    assert machine() == before


@pytest.mark.parametrize("words", [
    ("--bulk", "many"), ("--bulk",), ("--appliances", "NAS"), ("--appliances", "dc1"), ("--appliances", "a,a"),
    ("--appliances", "switch"), ("--stage", "/nowhere/at/all"), ("--share", "/nowhere"), ("--with-pid", "x"),
    ("extra",),
    ("--no-ad", "--bulk", "100"), ("--no-ad", "--nt4", "--trust"),
])
def test_wrong_options_are_told_in_one_line(make, words):
    lab = make("a")
    result = lab.command("up", *words)
    assert result.code == 2 and len(result.err.splitlines()) == 1, result
    assert not lab.folder.exists()


def test_a_stage_without_the_project_is_told_in_one_line(make, tmp_path):
    result = make("a").command("up", "--stage", tmp_path)
    assert result.code == 1 and result.err == f"lab: {tmp_path} is no staged tree: it has no usr/vorn\n", result


def test_a_folder_of_somebody_else_is_left_alone(tmp_path):
    lab = Lab(tmp_path)
    (tmp_path / "precious").write_text("x")
    for command in ("up", "down"):
        result = lab.command(command)
        assert result.code == 1 and "is not of a lab" in result.err and len(result.err.splitlines()) == 1, result
    assert (tmp_path / "precious").exists()
    for folder, code in (("relative", 2), (f"{tmp_path}/a b", 2), (f"{tmp_path}/a:b", 2), ("/etc/passwd", 1)):
        result = Lab(folder).command("down")
        assert result.code == code and len(result.err.splitlines()) == 1, result


@pytest.mark.parametrize("words, text", [
    (("--bounding-set", "-sys_admin", "--inh-caps", "-sys_admin"), "does not let root make namespaces"),
    (("--reuid", "65534", "--regid", "65534", "--clear-groups"), "only root"),
])
def test_a_missing_right_is_told_at_once_in_one_line(make, words, text):
    lab = make("a")
    result = run(["setpriv", *words, COMMAND, "up"], 20, env=lab.env)
    assert result.code == 1 and text in result.err and len(result.err.splitlines()) == 1, result
    assert result.seconds < 2 and not lab.folder.exists()
