"""./dev run, as somebody types it: the main job shown step by step, hints for the rest by hand, nothing left behind.
Builds what is not built."""

import contextlib
import os
import pathlib
import re
import signal
import subprocess
import sys
import time

import pytest

PROJECT = pathlib.Path(__file__).resolve().parents[2]
sys.path.insert(0, str(PROJECT / "tests" / "e2e"))
from lab import Lab, accounts, run  # noqa: E402

DEV = PROJECT / "dev"
# Patterns of each command, and of what its answer has to hold besides what "./dev run" itself looks for.
UNJOINED = [
    ("vornctl --json status", ""),
    ("vornctl status", "not a member"),
    ("curl .*/healthz", ""),
    ("curl .*/", ""),
]
MAIN_JOB = [
    ("vornctl join lab.test ", "The appliance is now a member of LAB."),
    ("vornctl steps", "trust"),
    ("vornctl status", "LAB"),
    ("curl .*/VORN.Core.Directory.Domain/1/get ", '"domain_name":"LAB"'),
    ("vornctl test", "works"),
    ("curl .*/VORN.Core.Directory.Domain/1/test_dc ", ""),
    ("vornctl list --v1", "LAB"),
    ("vornctl list", "lab.test"),
    ("curl .*/VORN.Core.Directory.Domain/2/get_domain_list ", ""),
    ("vornctl refresh", ""),
    ("vornctl users --limit 20", ""),
    ("vornctl groups --limit 20 --search nasusers", ""),
    ("vornctl users --domain OTHER", ""),
    ("vornctl options", r"Server signing +off"),
    ("vornctl call VORN.Core.Directory.Domain.Conf 1 set ", ""),
    ("testparm ", ""),
    ("vornctl options", r"Server signing +on .*Depth of nested groups +3 "),
    ("vornctl schedule --weekly sun,wed --at 03:30", ""),
    ("vornctl schedule", "03:30"),
    ("cat /etc/cron.d/vorn", "30 3 [*] [*] 0,3 root "),
    ("vornctl status", "LAB"),
]
LEAVE = [
    ("vornctl leave --yes", "The appliance is no member of a domain any more."),
    ("vornctl --json status", ""),
]
# As run_steps.sh prints them: the command, its answer further in, how long it took.
STEP = re.compile(r"^  \$ (.+)\n((?:    .*\n)+?)    \((\d+\.\d) s\)$", re.MULTILINE)


def traces():
    """What might be left behind on this machine."""
    mounts = pathlib.Path("/proc/self/mountinfo").read_text(encoding="utf-8").splitlines()
    links = subprocess.run(["ip", "-o", "link"], capture_output=True, text=True, check=True).stdout
    return sorted(re.sub(r"^\d+ \d+ ", "", line) for line in mounts), sorted(re.findall(r"^\d+: ([^:@]+)", links, re.M))


class Show:
    """./dev run with a lab of its own. Its output grows in a file."""

    def __init__(self, folder, *options):
        self.lab = Lab(folder / "state")
        self.file = folder / "output"
        with self.file.open("wb") as output:
            # A test that is started in the background would hand on that SIGINT is ignored.
            self.process = subprocess.Popen(
                [DEV, "run", *options], stdin=subprocess.DEVNULL, stdout=output, stderr=subprocess.STDOUT,
                env={**os.environ, **self.lab.env}, start_new_session=True,
                preexec_fn=lambda: signal.signal(signal.SIGINT, signal.SIG_DFL))
        self.networks = []

    @property
    def text(self):
        return self.file.read_text(encoding="utf-8", errors="backslashreplace")

    def wait_for(self, words, seconds):
        end = time.monotonic() + seconds
        while words not in self.text:
            assert self.process.poll() is None and time.monotonic() < end, f"no {words!r} in:\n{self.text}"
            time.sleep(0.1)

    def hold_networks(self):
        """Of all hosts. As long as they are held, no other gets the number of one that is gone."""
        for path in self.lab.folder.glob("hosts/*/init"):
            self.networks.append(os.open(f"/proc/{path.read_text().split()[0]}/ns/net", os.O_RDONLY))
        return len(self.networks)

    def inhabitants(self):
        """Processes in one of the networks."""
        known = {os.fstat(network).st_ino for network in self.networks}
        found = []
        for folder in pathlib.Path("/proc").glob("[1-9]*"):
            with contextlib.suppress(OSError):
                if (folder / "ns" / "net").stat().st_ino in known:
                    found.append((folder / "cmdline").read_bytes())
        return found

    def interrupt(self):
        """Ctrl-C."""
        os.killpg(self.process.pid, signal.SIGINT)

    def end(self, seconds):
        code = self.process.wait(seconds)
        assert not self.lab.folder.exists(), self.text
        # Of a process that was killed it may take a moment.
        deadline = time.monotonic() + 10
        while self.inhabitants():
            assert time.monotonic() < deadline, self.inhabitants()
            time.sleep(0.05)
        return code

    def close(self):
        if self.process.poll() is None:
            os.killpg(self.process.pid, signal.SIGKILL)
            self.process.wait()
        self.lab.down()
        for network in self.networks:
            os.close(network)


@pytest.fixture
def show(tmp_path):
    shown = []

    def start(*options):
        shown.append(Show(tmp_path, *options))
        return shown[-1]

    yield start
    for one in shown:
        one.close()


def check_steps(text, expected):
    """Exactly these, in this order, each with an answer and its time."""
    steps = STEP.findall(text)
    assert len(re.findall(r"^  \$ ", text, re.MULTILINE)) == len(steps), text
    assert len(steps) == len(expected), [command for command, _, _ in steps]
    for (command, answer, seconds), (pattern, words) in zip(steps, expected):
        assert re.match(pattern, command), (command, pattern)
        assert answer.strip() and re.search(words, answer, re.DOTALL), (command, answer)
        assert float(seconds) < 60, (command, seconds)


def test_the_main_job_is_shown_step_by_step(show):
    before = traces()
    shown = show("--once")
    shown.wait_for("Join lab.test", 400)
    assert shown.hold_networks() == 4 and shown.inhabitants()
    code = shown.end(240)
    assert code == 0, shown.text
    assert shown.text.splitlines()[-1] == "ok: joined, did the main job, and left", shown.text
    _, _, shown_steps = shown.text.partition("\nStatus: not a member of any domain yet\n")
    check_steps(shown_steps, UNJOINED + MAIN_JOB + LEAVE)
    assert traces() == before


def test_the_rest_can_be_done_by_hand_until_ctrl_c(show):
    before = traces()
    shown = show("--unjoined")
    shown.wait_for("Ctrl-C takes everything down\n", 300)
    text = shown.text
    assert text.splitlines()[-1] == "ok: the appliance nas1 is up and no member yet; Ctrl-C takes everything down"
    _, _, told = text.partition("\nStatus: not a member of any domain yet\n")
    steps, _, hints = told.partition("\nIn another terminal, first of all:  export LAB_DIR=")
    check_steps(steps, UNJOINED)
    assert hints.splitlines()[0] == str(shown.lab.folder), hints
    for command in ("join lab.test --user Administrator --dns 10.77.0.10", "status", "--help"):
        assert f"  ./dev lab exec nas1 vornctl {command}\n" in hints
    for user in accounts():
        assert re.search(rf"^  {user['domain']} +{re.escape(user['name'])} +{re.escape(user['password'])} ", hints,
                         re.MULTILINE), user
    assert re.search(r"^  account admin, password \S+$", hints, re.MULTILINE), hints
    link = re.search(r"  (https://127\.0\.0\.1:\d+)/#/link/\S+$", hints, re.MULTILINE)
    assert link and f"\n  {link[1]}/\n" in hints, hints
    # What it says is to be done can be done.
    result = shown.lab.exec("nas1", "vornctl", "--json", "status")
    assert result.code == 0 and '"enable_domain":false' in result.out.replace(" ", ""), result
    assert shown.hold_networks() == 4 and shown.inhabitants()
    shown.interrupt()
    assert shown.end(30) == 0, shown.text
    assert traces() == before


def test_a_missing_right_is_told_at_once(tmp_path):
    lab = Lab(tmp_path / "state")
    result = run(["setpriv", "--bounding-set", "-sys_admin", "--inh-caps", "-sys_admin", DEV, "run"], 20, env=lab.env)
    assert result.code == 1 and result.out == "" and result.seconds < 5, result
    assert result.err.strip() == ("FAILED: this machine does not let root make namespaces. In a container: start it "
                                  "privileged (docker: --privileged)")
    assert not lab.folder.exists()


def test_an_option_that_is_none_is_told_in_one_line(tmp_path):
    lab = Lab(tmp_path / "state")
    result = run([DEV, "run", "--nope"], 10, env=lab.env)
    assert result.code == 2 and result.out == "", result
    assert result.err == '"run" takes no "--nope". "./dev run --help" tells what it takes.\n'
    assert not lab.folder.exists()
