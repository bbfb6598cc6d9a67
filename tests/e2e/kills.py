"""The appliance's programs killed at chosen moments of a join, and what must be right afterwards."""

import contextlib
import json
import threading
import time

from client import DIRECTORY
from lab import password
from processes import kill, processes, programs

# What the appliance's programs run. The daemons of the file-sharing service live on.
TOOLS = {"net", "wbinfo", "rpcclient", "nmblookup", "nslookup", "smbcontrol", "testparm", "timeout", "dash", "sh"}
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

    def run(self):
        """Has a join begun that is not over?"""
        record = self.read()
        return record.get("id") not in (None, self.before) and record["finished"] is None

    def wait_for_the_end(self):
        end = time.monotonic() + 60
        while self.read().get("id") in (None, self.before) or self.run():
            assert time.monotonic() < end, "the join tool does not come to its end"
            time.sleep(0.001)


class Call(threading.Thread):
    """A call whose server may die before it answers."""

    def __init__(self, function, *words, **more):
        super().__init__(daemon=True)
        self.function = lambda: function(*words, **more)
        self.answer = None
        self.failure = None
        self.start()

    def run(self):
        try:
            self.answer = self.function()
        except OSError:
            pass
        except Exception as error:  # it is the caller's, not this thread's
            self.failure = error

    def wait(self):
        self.join(60)
        assert not self.is_alive(), "the call of a killed server hangs"
        if self.failure:
            raise self.failure
        return self.answer


END = "end of the tool"


def kill_in_join(machine, victims, step, offset, domain, **more):
    """Joins, and kills so many seconds after that step began, after the tool has told the END, or with step None after
    the request was sent. Was the join running, and its call without an answer?"""
    steps = Steps(machine)
    name, secret = administrator(domain)
    call = Call(machine.client.join, domain, name, more.pop("password", secret), **more)
    if step == END:
        steps.wait_for_the_end()
        time.sleep(offset)
    elif step is None or steps.wait_for(step, lambda: not call.is_alive()):
        time.sleep(offset)
    waiting = call.is_alive()
    killed = kill(lambda: victims(machine))
    assert killed
    hit = waiting and steps.run()
    call.wait()
    return hit


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


def check_kept(machine, before, log):
    """A changed DNS list or trust switch that belongs to no finished join is named in the log, and nothing else is."""
    changed = machine.read("/etc/resolv.conf") != before["/etc/resolv.conf"][0]
    assert ("the DNS servers are still" in log) == changed, f"changed: {changed}; {log}"
    changed = b"trustdomain=yes" not in machine.read("/etc/vorninfo.conf")
    assert ("the trusted-domain setting is still changed" in log) == changed, f"changed: {changed}; {log}"


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
    assert machine.temporaries() == []


class Points:
    """Tries a check at many points, and tells of each that failed."""

    def __init__(self, machine):
        self.machine = machine
        self.failures = []
        self.seen = []
        self.hits = 0

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
        return self.hits
