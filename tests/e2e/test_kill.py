"""The server, or all of the appliance's programs at once, killed at many points of a join and of a refresh: afterwards
a membership works, old or new, or the appliance is cleanly in its workgroup, and nothing waits for what is gone."""

import contextlib
import json
import threading
import time

import pytest

from client import DIRECTORY
from lab import password
from processes import kill, processes, programs, wait_for_tasks

MARKER = "/tmp/domain_updating"
LAB_USERS = {"alice", "jörg", "norights"}
# What the appliance's programs run. The daemons of the file-sharing service live on.
TOOLS = {"net", "wbinfo", "rpcclient", "nmblookup", "nslookup", "smbcontrol", "testparm", "timeout", "dash", "sh"}
TEMPORARY = r".*\(\.vorn-[A-Za-z0-9]*\|\.tmp\|\.new\|-journal\|\.damaged\)"
TEMPORARY_FOLDERS = ("/usr/vorn/etc", "/etc", "/run/vorn", "/var/lib/vorn", "/var/log", "/var/lib/samba", "/tmp")
# As long as an interrupted tool of Samba may go on, and then some.
SETTLED_SECONDS = 60


def administrator(domain):
    return "Administrator", password({"lab.test": "LAB"}.get(domain, domain), "Administrator")


def server(machine):
    return [process for process in programs(machine, "vornd") if process.arguments[1:2] != ["--task"]]


def everything(machine):
    return [process for process in processes(machine)
            if process.program.startswith("/usr/vorn/") or process.name in TOOLS]


VICTIMS = {"server": server, "everything": everything}


class Steps:
    """The join's record, as it grows."""

    def __init__(self, machine):
        self.path = machine.path("/run/vorn/join_steps.json")
        self.before = self.read().get("id")

    def read(self):
        try:
            return json.loads(self.path.read_bytes())
        except FileNotFoundError:
            return {}

    def wait_for(self, name, gone):
        """Until the step has begun; False when the join is over before."""
        end = time.monotonic() + 60
        while time.monotonic() < end:
            over = gone()
            record = self.read()
            if record.get("id") not in (None, self.before) and any(
                    step["name"] == name for step in record["steps"]):
                return True
            if over:
                return False
            time.sleep(0.001)
        raise TimeoutError(f"neither the step {name} nor the end of the join within 60 s")


class Call(threading.Thread):
    """A call whose server may die before it answers."""

    def __init__(self, function, *words, **more):
        super().__init__(daemon=True)
        self.function = lambda: function(*words, **more)
        self.answer = None
        self.start()

    def run(self):
        with contextlib.suppress(ConnectionError, OSError):
            self.answer = self.function()

    def wait(self):
        self.join(60)
        assert not self.is_alive(), "the call of a killed server hangs"
        return self.answer


def kill_in_join(machine, victims, step, offset, domain, **more):
    """Joins, and kills so many seconds after that step began; step None: after the request was sent."""
    steps = Steps(machine)
    call = Call(machine.client.join, domain, *administrator(domain), **more)
    if step is None or steps.wait_for(step, lambda: not call.is_alive()):
        time.sleep(offset)
    killed = kill(lambda: victims(machine))
    call.wait()
    return killed


def start_again(machine):
    """Starts the server; answers what the log says from there on."""
    machine.wait_until(lambda: not server(machine), 10, "the end of the killed server")
    mark = len(machine.syslog())
    started = time.monotonic()
    machine.start()
    seconds = time.monotonic() - started
    assert seconds < 15, f"the start took {seconds:.1f} s"
    machine.wait_until(lambda: not programs(machine, "vornjoin"), SETTLED_SECONDS, "the end of the join tool")
    return machine.syslog()[mark:]


def temporaries(machine):
    found = machine.exec("find", *TEMPORARY_FOLDERS, "-xdev", "-regex", TEMPORARY).out.split("\n")
    # Samba keeps databases whose names look alike.
    return [path for path in found if path and not path.startswith("/var/lib/samba/")]


def check_kept(machine, before, log):
    """A changed DNS list or trust switch that belongs to no finished join is named in the log."""
    if machine.read("/etc/resolv.conf") != before["/etc/resolv.conf"][0]:
        assert "the DNS servers are still" in log, f"changed DNS servers are not named: {log}"
    if b"trustdomain=yes" not in machine.read("/etc/vorninfo.conf"):
        assert "the trusted-domain setting is still changed" in log, f"the trust switch is not named: {log}"


def check_workgroup(machine):
    conf = machine.read("/usr/vorn/etc/smb.conf")
    assert b"LAB" not in conf.upper() and b"NT4DOM" not in conf.upper(), conf
    secrets = machine.exec("tdbdump", "/var/lib/samba/private/secrets.tdb").out
    assert "MACHINE_PASSWORD" not in secrets, "a secret of a domain is left"
    assert not machine.exists("/etc/krb5.keytab") or "@LAB.TEST" not in machine.exec("klist", "-k").out
    assert not programs(machine, "winbindd"), "winbindd runs in a workgroup"
    assert machine.client.test_dc() is False


def check_member(machine, status):
    kind = {"AD": "ads", "NT4": "rpc"}[status["domain_type"]]
    assert machine.trust_works(kind), machine.net(kind, "testjoin").text
    assert machine.client.test_dc() is True
    assert programs(machine, "winbindd"), "winbindd does not run"
    result = machine.exec("wbinfo", "-t", deadline=30)
    assert result.code == 0, result


def check_settled(machine, before, log, domains):
    """Whatever was killed. DOMAINS: which ones the appliance may be in afterwards; None for its workgroup."""
    status = machine.client.get()
    domain = status["domain_name"] if status["enable_domain"] else None
    assert domain in domains, f"the appliance is in {domain}"
    if domain is None:
        check_workgroup(machine)
    else:
        check_member(machine, status)
    if before is not None and domain is None:
        check_kept(machine, before, log)
    assert machine.exec("find", "/usr/vorn/etc/private/join", "-type", "f").out == "", "the journal is left"
    record = machine.client.call(DIRECTORY, 1, "join_steps").data
    assert record is None or record["finished"] is not None, f"a dead join counts as running: {record}"
    assert temporaries(machine) == []


class Points:
    """Tries a check at many points, and tells of each that failed."""

    def __init__(self, machine):
        self.machine = machine
        self.failures = []
        self.seen = []

    @contextlib.contextmanager
    def at(self, *point):
        self.seen.append(point)
        try:
            yield
        except Exception as error:  # every point is to be tried
            self.failures.append(f"{point}: {type(error).__name__}: {error}\n{self.machine.ctl('steps').text}\n"
                                 f"{self.machine.syslog()[-3000:]}")

    def done(self, count):
        assert len(self.seen) == count
        assert not self.failures, f"{len(self.failures)} of {count} points:\n" + "\n".join(self.failures)


# A step of a join, and seconds after its begin.
JOIN_POINTS = [
    (None, 0.0), (None, 0.02), ("request", 0.0), ("ports", 0.0), ("workgroup", 0.05), ("credentials", 0.0),
    ("computer account", 0.0), ("configuration", 0.0), ("join", 0.0), ("join", 0.15), ("join", 0.3), ("join", 0.45),
    ("join", 0.6), ("join", 0.8), ("confirm join", 0.0), ("activate", 0.0), ("winbind", 0.0), ("trust", 0.1),
    ("dns", 0.1), ("domains", 0.05),
]
# The server's own work after the join tool's end.
LATE_POINTS = [("domains", 0.2), ("domains", 0.4)]


@pytest.mark.parametrize("victims, points", [
    ("everything", JOIN_POINTS + LATE_POINTS), ("server", JOIN_POINTS[1::3] + LATE_POINTS),
])
def test_a_killed_join(appliance, victims, points):
    tried = Points(appliance)
    for step, offset in points:
        with tried.at(victims, step, offset):
            appliance.renew()
            before = appliance.configuration()
            killed = kill_in_join(appliance, VICTIMS[victims], step, offset, "lab.test",
                                  dns="10.77.0.10,10.77.0.1", manage_mode=1)
            assert any(process.pid for process in killed)
            log = start_again(appliance)
            check_settled(appliance, before, log, (None, "LAB"))
    tried.done(len(points))


# From the membership of LAB: a join of it again, and of the other kind of domain.
AGAIN_POINTS = [
    ("configuration", 0.0), ("join", 0.1), ("join", 0.3), ("join", 0.5), ("join", 0.7), ("confirm join", 0.0),
    ("activate", 0.0), ("trust", 0.0), ("dns", 0.0),
]
CHANGE_POINTS = [
    ("configuration", 0.0), ("join", 0.0), ("join", 0.1), ("join", 0.2), ("confirm join", 0.0), ("activate", 0.0),
    ("winbind", 0.05), ("trust", 0.0), ("domains", 0.0),
]


def become_member(machine):
    status = machine.client.get()
    if status.get("domain_name") != "LAB":
        answer = machine.client.join("lab.test", *administrator("lab.test"))
        assert answer.ok, machine.ctl("steps").text


@pytest.mark.parametrize("domain, points, left", [
    ("lab.test", AGAIN_POINTS, ("LAB", None)), ("NT4DOM", CHANGE_POINTS, ("LAB", "NT4DOM")),
])
def test_a_killed_join_of_a_member(member, domain, points, left):
    tried = Points(member)
    for number, (step, offset) in enumerate(points):
        victims = "server" if number % 4 == 3 else "everything"
        with tried.at(domain, victims, step, offset):
            become_member(member)
            before = member.configuration()
            kill_in_join(member, VICTIMS[victims], step, offset, domain)
            log = start_again(member)
            check_settled(member, before, log, left)
            if left[1] is None and not member.client.get()["enable_domain"]:
                assert "join again" in log, "nothing says why the appliance is in its workgroup"
    tried.done(len(points))


def users_of(machine, domain="LAB"):
    page = machine.client.call(DIRECTORY, 1, "users", {"domain": domain, "offset": 0, "limit": 1000}).data
    return {entry["name"] for entry in page["entries"]}


def wait_for_end(machine, task):
    """The last status of a refresh, which must have one."""
    end = time.monotonic() + 30
    while True:
        answer = machine.client.refresh_status(task)
        if not (answer.ok and answer.data == {"status": "updating"}):
            return answer
        assert time.monotonic() < end, f"the refresh {task} says \"updating\" for ever"
        time.sleep(0.05)


def check_refresh(machine, task, alone):
    """ALONE: only the server was killed, so the task goes on."""
    if task is not None:
        answer = wait_for_end(machine, task)
        assert not alone or answer.data == {"status": "finish"}, answer.body
    assert LAB_USERS <= users_of(machine), "a killed refresh has emptied a list"
    if not alone:
        assert temporaries(machine) == []
    marker = machine.exists(MARKER)
    end = time.monotonic() + 30
    while True:
        answer = machine.client.start_refresh()
        if answer.ok or answer.code != 2626 or not alone:
            break
        assert time.monotonic() < end, "a refresh counts as running for ever"
        time.sleep(0.05)
    assert wait_for_end(machine, answer.data["task_id"]).data == {"status": "finish"}
    wait_for_tasks(machine)
    assert not machine.exists(MARKER)
    assert temporaries(machine) == []
    for domain in ("LAB", "OTHER"):
        for kind in ("user", "group"):
            assert machine.exists(f"/usr/vorn/etc/private/domain_{kind}_{domain}.db")
    return marker


def test_a_killed_refresh(member):
    started = time.monotonic()
    assert member.client.refresh().data == {"status": "finish"}
    whole = time.monotonic() - started
    wait_for_tasks(member)
    tried = Points(member)
    markers = 0
    for number in range(20):
        victims = "server" if number % 3 == 2 else "everything"
        offset = whole * number / 19
        with tried.at(victims, "refresh", offset):
            call = Call(member.client.start_refresh)
            time.sleep(offset)
            kill(lambda: VICTIMS[victims](member))
            answer = call.wait()
            start_again(member)
            task = answer.data["task_id"] if answer else None
            markers += check_refresh(member, task, alone=victims == "server")
    tried.done(20)
    assert markers > 0


def test_what_killed_writers_leave_blocks_no_start_and_goes(member):
    assert member.client.refresh().ok
    member.kill()
    left = ["/usr/vorn/etc/.smbinfo.conf.vorn-aB3dE6", "/usr/vorn/etc/.smb.conf.vorn-000000",
            "/usr/vorn/etc/private/.domain_user_LAB.db.vorn-000000", "/run/vorn/.join_steps.json.vorn-000000",
            "/var/lib/vorn/.domains.json.vorn-000000",
            "/etc/.vorninfo.conf.vorn-000000", "/etc/.resolv.conf.vorn-000000", "/etc/cron.d/.vorn.vorn-000000"]
    for path in left:
        member.write(path, "half")
    for path in ("/usr/vorn/etc/smbinfo.conf.tmp", "/usr/vorn/etc/private/directory/.user_LAB.db.vorn-000000",
                 "/usr/vorn/etc/private/directory/.group_LAB.db.vorn-000000", "/usr/vorn/etc/private/join/staging.new"):
        member.write(path, "half")
    for path in (MARKER, "/tmp/domain_user.pid", "/tmp/domain_group.pid"):
        member.write(path, "99999\n")
    start_again(member)
    assert temporaries(member) == []
    assert LAB_USERS <= users_of(member)
    assert member.client.refresh().data == {"status": "finish"}
    wait_for_tasks(member)
    assert not member.exists(MARKER)


def test_a_killed_server_leaves_a_failing_join_to_its_tool(appliance):
    """Nobody is there to put back what was changed ahead of the join: the next start names it."""
    before = appliance.configuration()
    steps = Steps(appliance)
    call = Call(appliance.client.join, "lab.test", "Administrator", "not the passw0rd", dns="10.77.0.10,10.77.0.1",
                manage_mode=1)
    assert steps.wait_for("request", lambda: not call.is_alive())
    kill(lambda: server(appliance))
    call.wait()
    log = start_again(appliance)
    check_settled(appliance, before, log, (None,))
    assert appliance.read("/etc/resolv.conf") != before["/etc/resolv.conf"][0]
    # Named once.
    appliance.kill()
    assert "are still" not in start_again(appliance)
