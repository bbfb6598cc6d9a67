"""A refresh stopped in its middle, started twice, beside a fetch of the appliance's own, and what is said of tasks."""

import contextlib
import json
import os
import pty
import re
import select
import signal
import threading
import time

import pytest

from client import DIRECTORY, DOMAIN
from lab import COMMAND
from processes import programs, tasks, wait_for_tasks

MARKER = "/tmp/domain_updating"
PID_FILES = ("/tmp/domain_user.pid", "/tmp/domain_group.pid")
PROGRESS = "/run/vorn/refresh.json"
EXIT_CODE = "/tmp/own_fetch.code"


@pytest.fixture(scope="module")
def listed(joined):
    assert joined.client.refresh().ok
    return joined


@pytest.fixture
def member(listed, lab):
    """A member with lists; no refresh runs before and after a test."""
    yield listed
    lab.must("fault", "none")
    listed.client.call(DOMAIN, 1, "update_stop")


def lists(machine):
    return {(row["domain"], row["kind"]): row for row in machine.client.call(DIRECTORY, 1, "domains").data["domains"]}


def progress(machine):
    text = machine.read(PROGRESS)
    return json.loads(text) if text else {}


def leaders(found):
    """The processes that none of the others has started."""
    pids = {process.pid for process in found}
    # What has ended meanwhile has no parent any more.
    return [process for process in found if process.parent not in pids and process.program]


def fetchers(machine):
    """The processes that the pid files name; a killed one leaves its file."""
    named = [(machine.read(path) or b"").decode().strip() for path in PID_FILES]
    return [process for process in programs(machine, "vornd", "vornwin") if str(process.pid) in named]


def wait_for_fetch(machine):
    machine.wait_until(lambda: fetchers(machine), 20, "a fetch")
    machine.wait_until(lambda: progress(machine).get("kind") == "user", 20, "a fetch of users")


def wait_for_end(machine, task, seconds=60):
    end = time.monotonic() + seconds
    while True:
        answer = machine.client.refresh_status(task)
        if not answer.ok or answer.data["status"] != "updating":
            return answer
        assert time.monotonic() < end, answer.body
        time.sleep(0.1)


def assert_quiet(machine):
    """Nothing of a refresh is left: no process, no marker, no pid file, nothing half done."""
    wait_for_tasks(machine)
    assert not machine.exists(MARKER)
    assert not any(machine.exists(path) for path in PID_FILES)
    half = machine.must("find", "/usr/vorn/etc/private/directory", "-type", "f", "!", "-name", "user_*.db", "!",
                        "-name", "group_*.db").out
    assert half == ""


def test_stopped_in_its_middle(member, lab):
    client, before = member.client, lists(member)
    with lab.fault("slow", only=member.host):
        task = client.start_refresh().data["task_id"]
        wait_for_fetch(member)
        assert client.refresh_status(task).data == {"status": "updating"}
        assert member.exists(MARKER)
        answer = client.call(DOMAIN, 1, "update_stop")
        assert answer.body == {"success": True, "data": None} and answer.seconds < 5
        assert client.refresh_status(task).code == 121
        assert tasks(member) == []
        # A second stop, and one with nothing to stop, are no failures and change nothing.
        assert client.call(DOMAIN, 1, "update_stop").ok
        assert client.refresh_status(task).code == 121
    assert lists(member) == before
    for domain, kind in before:
        assert member.exists(f"/usr/vorn/etc/private/directory/{kind}_{domain}.db")
    finished = client.start_refresh().data["task_id"]
    assert wait_for_end(member, finished).data == {"status": "finish"}
    assert_quiet(member)
    assert all(lists(member)[key]["fetched"] >= row["fetched"] for key, row in before.items())
    for domain, kind in before:
        assert member.exists(f"/usr/vorn/etc/private/domain_{kind}_{domain}.db")
    # Stopping what has finished changes nothing.
    assert client.call(DOMAIN, 1, "update_stop").ok
    assert client.refresh_status(finished).data == {"status": "finish"}


def test_started_twice(member, lab):
    client = member.client
    with lab.fault("slow", only=member.host):
        task = client.start_refresh("LAB").data["task_id"]
        for name in (None, "@all", "LAB", "OTHER", ""):
            answer = client.start_refresh(name)
            assert (answer.status, answer.code) == (200, 2626), answer.body
        assert client.start_refresh(5).code == 2618
        assert len(leaders(tasks(member))) == 1
    assert wait_for_end(member, task).data == {"status": "finish"}
    wait_for_tasks(member)
    assert client.refresh_status(client.start_refresh("LAB").data["task_id"]).ok
    assert client.call(DOMAIN, 1, "update_stop").ok


def test_a_killed_one_has_failed_and_its_marker_is_in_nobodys_way(member, lab):
    client = member.client
    with lab.fault("slow", only=member.host):
        task = client.start_refresh().data["task_id"]
        wait_for_fetch(member)
        for process in tasks(member):
            process.signal(signal.SIGKILL)
        member.wait_until(lambda: not client.refresh_status(task).ok, 5, "the end of the task")
        assert client.refresh_status(task).code == 120
        assert member.exists(MARKER)
    assert client.refresh("LAB").data == {"status": "finish"}
    assert_quiet(member)


UNKNOWN = ["DomainUpdate_00000000000000000000000000000000", "DomainUpdate_", "nothing", "", "../../etc/passwd",
           "DomainUpdate_%", "' OR '1'='1", "x" * 5000, "ä", "a\x00b", "-x"]


def test_status_of_what_is_no_task(member):
    for task in UNKNOWN:
        answer = member.client.refresh_status(task)
        assert (answer.status, answer.code) == (200, 117), (task, answer.body)
        assert answer.body["error"]["errors"] == 122, (task, answer.body)
    for task in (5, None, [], {}, True):
        assert member.client.refresh_status(task).code == 2618, task
    assert member.client.call(DOMAIN, 1, "update_status").code == 2618


def test_status_of_one_that_failed(member, lab):
    with lab.fault("ldap-drop", only=member.host):
        task = member.client.start_refresh("LAB").data["task_id"]
        answer = wait_for_end(member, task)
    assert answer.body == {"success": False, "error": {"code": 2623, "errors": None}}
    # It says so as often as it is asked, also after a restart of the server.
    member.stop()
    member.start()
    assert member.client.refresh_status(task).body == answer.body
    assert_quiet(member)


class Terminal:
    """vornctl at a terminal of its own."""

    def __init__(self, machine, *words):
        self.machine = machine
        self.text = ""
        command = [str(COMMAND), "exec", machine.host, "/usr/vorn/bin/vornctl", *words]
        self.pid, self.end = pty.fork()
        if self.pid == 0:
            os.execve(command[0], command, {**os.environ, **machine.lab.env})

    def read_until(self, expression, seconds=20):
        end = time.monotonic() + seconds
        while not re.search(expression, self.text):
            assert time.monotonic() < end, self.text
            if select.select([self.end], [], [], 0.2)[0]:
                try:
                    self.text += os.read(self.end, 4096).decode(errors="backslashreplace")
                except OSError:
                    break
        assert re.search(expression, self.text), self.text

    def interrupt(self):
        for process in programs(self.machine, "vornctl"):
            process.signal(signal.SIGINT)

    def type(self, text):
        os.write(self.end, text.encode())

    def close(self):
        """The exit code."""
        end = time.monotonic() + 20
        while True:
            pid, status = os.waitpid(self.pid, os.WNOHANG)
            if pid:
                os.close(self.end)
                return os.waitstatus_to_exitcode(status)
            assert time.monotonic() < end, self.text
            time.sleep(0.05)


def test_ctrl_c_asks_and_stops(member, lab):
    before = lists(member)
    with lab.fault("slow", only=member.host):
        terminal = Terminal(member, "refresh")
        terminal.read_until("Refreshing: ")
        wait_for_fetch(member)
        terminal.interrupt()
        terminal.read_until("Stop the refresh?")
        assert tasks(member)
        terminal.type("w\n")
        terminal.read_until("(?s)Stop the refresh.*Refreshing: ")
        terminal.interrupt()
        terminal.read_until("(?s)Stop the refresh.*Stop the refresh")
        terminal.type("s\n")
        terminal.read_until("has been stopped")
        assert terminal.close() == 4
        assert tasks(member) == []
    assert lists(member) == before


def test_ctrl_c_without_a_terminal_leaves_it_running(member, lab):
    ended = []
    with lab.fault("slow", only=member.host):
        command = threading.Thread(
            target=lambda: ended.append(member.exec("setsid", "-w", "/usr/vorn/bin/vornctl", "refresh", "--domain",
                                                    "LAB")))
        command.start()
        wait_for_fetch(member)
        found = programs(member, "vornctl")
        assert found
        for process in found:
            process.signal(signal.SIGINT)
        command.join(10)
        assert ended[0].code == 4 and "goes on in the appliance" in ended[0].err, ended
        assert tasks(member)
        # The next one follows it to its end.
        result = member.ctl("refresh")
    assert result.code == 0 and "following that one" in result.err, result
    assert_quiet(member)


def wait_until_after(second):
    while int(time.time()) <= second:
        time.sleep(0.05)


class OwnFetch:
    """The appliance's own refresh, as the scheduler runs it, standing still in its fetch until it may go on."""

    def __init__(self, machine, lab):
        self.machine = machine
        machine.must("rm", "-f", EXIT_CODE)
        # Whoever waits for a process that is stopped is stopped with it, so nobody waits.
        script = "(env -i /usr/vorn/sbin/vornwin -updateDomain; echo $? >$1) >/dev/null 2>&1 &"
        # The controller takes its time, so that no list is stored before the fetch stands still.
        with lab.fault("slow", only=machine.host):
            machine.must("sh", "-c", script, "start", EXIT_CODE)
            machine.wait_until(lambda: fetchers(machine), 20, "the appliance's own fetch")
            self.stopped = {}
            # Until there is none that another one started just before it stood still.
            while more := [each for each in programs(machine, "vornwin") if each.pid not in self.stopped]:
                for process in more:
                    process.signal(signal.SIGSTOP)
                    self.stopped[process.pid] = process

    def end(self):
        """Lets it go on to its end, and answers the exit code."""
        for process in self.stopped.values():
            process.signal(signal.SIGCONT)
        self.machine.wait_until(lambda: self.machine.read(EXIT_CODE), 60, "the end of the appliance's own fetch")
        return int(self.machine.read(EXIT_CODE))


@contextlib.contextmanager
def own_fetch(machine, lab):
    fetch = OwnFetch(machine, lab)
    try:
        yield fetch
    finally:
        fetch.end()


def test_beside_a_fetch_of_the_appliances_own(member, lab):
    client, before = member.client, lists(member)
    # Lists tell their age in whole seconds.
    wait_until_after(max(row["fetched"] for row in before.values()))
    member.must("rm", "-f", MARKER)
    with own_fetch(member, lab) as fetch:
        assert not member.exists(MARKER)
        pid = member.read(PID_FILES[0])
        task = client.start_refresh("LAB").data["task_id"]
        assert client.refresh_status(task).data == {"status": "updating"}
        assert client.start_refresh().code == 2626
        # It waits, and fetches nothing: longer than it pauses between two looks.
        time.sleep(4)
        assert client.refresh_status(task).data == {"status": "updating"}
        assert member.exists(MARKER)
        assert member.read(PID_FILES[0]) == pid
        assert lists(member) == before
        # Another one of the appliance's own steps aside.
        assert member.exec("/usr/vorn/sbin/vornwin", "-updateDomain").code == 3
        assert fetch.end() == 0
        assert all(row["fetched"] > before[key]["fetched"] for key, row in lists(member).items())
        assert wait_for_end(member, task).data == {"status": "finish"}
        assert_quiet(member)


def test_stopping_ends_the_waiting_and_not_the_appliances_own_fetch(member, lab):
    client, began = member.client, time.time()
    with own_fetch(member, lab) as fetch:
        task = client.start_refresh().data["task_id"]
        assert client.call(DOMAIN, 1, "update_stop").ok
        assert client.refresh_status(task).code == 121
        assert programs(member, "vornwin")
        assert fetch.end() == 0
    assert all(row["fetched"] >= int(began) for row in lists(member).values())


def test_the_appliances_own_fetch_steps_aside(member, lab):
    with lab.fault("slow", only=member.host):
        task = member.client.start_refresh("LAB").data["task_id"]
        wait_for_fetch(member)
        result = member.exec("/usr/vorn/sbin/vornwin", "-updateDomain")
        assert result.code == 3 and result.seconds < 5, result
    assert wait_for_end(member, task).data == {"status": "finish"}
