"""Passwords: of the account that joins and of the machine itself. They are in no list of processes, no file, no log and
no answer but where they must be, whether a join succeeds, fails or is killed."""

import base64
import contextlib
import json
import os
import pathlib
import re
import secrets
import signal
import stat
import threading
import time

import pytest

from client import DIRECTORY, DOMAIN
from processes import processes, programs

# What the appliance hands the password to by the environment, which nobody but root can read. "timeout" is what ends
# the join's own tool should its caller die.
TOOLS = {"net", "rpcclient", "timeout"}
VARIABLE = "PASSWD"
WRITABLE = ("var", "run", "etc", "usr/vorn", "tmp", "root", "home", "srv", "opt", "dev/shm")
# The domains that the lab keeps for the next time.
FOREIGN = {"/var/cache/vorn-lab"}
SECRETS = "/var/lib/samba/private/secrets.tdb"


class Canary:
    """A password that stands nowhere else in the world: its middle is looked for, so that no escaping hides it."""

    def __init__(self):
        self.middle = secrets.token_hex(12)
        self.text = f"Cän %'\"{self.middle}$\\ Z"


def spellings(text):
    """As which bytes a text may stand in a file."""
    plain = text.encode()
    found = {plain, plain.hex().encode(), plain.hex().upper().encode()}
    for wide in (text.encode("utf-16-le"), text.encode("utf-16-be")):
        found.add(wide)
    # Wherever it begins in what was encoded: without the ends, which depend on the neighbours.
    for shift in range(3):
        found.add(base64.b64encode(b"x" * shift + plain)[4:-4])
    return found


def files_written(machine, since):
    """Every file of the appliance that was written since then, as (path, content)."""
    root = str(machine.lab.root(machine.host))
    for top in WRITABLE:
        for at, folders, names in os.walk(f"{root}/{top}"):
            folders[:] = [name for name in folders if f"{at}/{name}".removeprefix(root) not in FOREIGN]
            for name in names:
                with contextlib.suppress(OSError):  # gone meanwhile
                    info = os.lstat(f"{at}/{name}")
                    if stat.S_ISREG(info.st_mode) and info.st_ctime >= since:
                        yield f"{at}/{name}".removeprefix(root), pathlib.Path(at, name).read_bytes()
            if top == "root":
                break  # what the machine's own administrator has there is a lot, and none of a program's


def where(machine, since, text):
    wanted = spellings(text)
    return [path for path, content in files_written(machine, since) if any(piece in content for piece in wanted)]


class Sampler:
    """Reads the arguments and the environment of every process of a host, again and again."""

    def __init__(self, machine):
        self.machine = machine
        self.arguments = {}
        self.environments = {}
        self.passes = 0
        self.ended = threading.Event()
        self.thread = threading.Thread(target=self.run, daemon=True)

    def __enter__(self):
        self.started = time.monotonic()
        self.thread.start()
        return self

    def __exit__(self, *_):
        self.seconds = time.monotonic() - self.started
        self.ended.set()
        self.thread.join(10)

    def run(self):
        while not self.ended.is_set():
            for process in processes(self.machine):
                self.arguments.setdefault(process.read("cmdline"), process)
                environment = process.read("environ")
                if environment not in self.environments:
                    self.environments[environment] = (process.program, self.owner(process))
            self.passes += 1

    @staticmethod
    def owner(process):
        """Who may read the environment: the owner and the mode of its file, and the process's users."""
        try:
            info = os.stat(f"{process.folder}/environ")
            return info.st_uid, oct(info.st_mode & 0o777), process.status("Uid")
        except OSError:
            return None

    def check(self, *texts):
        """Arguments hold none of the texts, environments only where they may; answers in which programs' ones."""
        seen = set()
        for text in texts:
            plain = text.encode()
            for words in self.arguments:
                assert plain not in words, f"in the arguments of {words!r}"
            for environment, (program, owner) in self.environments.items():
                for entry in environment.split(b"\0"):
                    if plain in entry:
                        assert entry.startswith(VARIABLE.encode() + b"="), f"{program}: {entry!r}"
                        name = os.path.basename(program)
                        assert name in TOOLS | {""}, f"in the environment of {program}"
                        assert owner is None or not owner[2] or owner == (0, "0o400", ["0"] * 4), owner
                        seen.add(name)
        return seen


@pytest.fixture
def canary(lab):
    """An account of LAB.TEST, for now without any right."""
    made = Canary()
    result = lab.exec("dc1", "samba-tool", "user", "create", "canary", made.text, deadline=60)
    assert result.code == 0, result
    yield made
    lab.exec("dc1", "samba-tool", "user", "delete", "canary", deadline=60)


def give_rights(lab):
    result = lab.exec("dc1", "samba-tool", "group", "addmembers", "Domain Admins", "canary", deadline=60)
    assert result.code == 0, result


class Answers:
    """Every answer that a client got, as text."""

    def __init__(self, machine):
        self.machine = machine
        self.texts = []

    def keep(self, answer):
        self.texts.append(json.dumps(answer.body, ensure_ascii=False))
        return answer

    def join(self, *words, **more):
        return self.keep(self.machine.client.join(*words, **more))

    def raw(self, target, body):
        status, text = self.machine.client.request("POST", target, body)
        self.texts.append(text.decode(errors="backslashreplace"))
        return status

    def ctl(self, *words, **more):
        result = self.machine.ctl(*words, **more)
        self.texts.append(result.text)
        return result

    def holding(self, text):
        return [answer for answer in self.texts if text in answer]


def machine_password(machine):
    """What the appliance has for its own account: the bytes of the secret, as text."""
    dump = machine.must("tdbdump", "-k", "SECRETS/MACHINE_PASSWORD/LAB", SECRETS).out
    raw = re.sub(rb"\\([0-9A-Fa-f]{2})", lambda found: bytes([int(found[1], 16)]), dump.strip().encode())
    return raw.rstrip(b"\0").decode()


def fail_at_every_step(machine, lab, canary, answers):
    """The password goes along as a right and as a wrong one; the account has no right to join."""
    for user, more, code in [
        ("Administrator", {}, 2607),  # credentials: a wrong password
        ("nobody-here", {}, 2607),
        ("canary", {}, 2611),  # join: a right one, without the right to join
        ("canary", {"advance_domain_conf": {"enable_advance_option": True, "netbios_name": "WRONGWG"}}, 2604),
    ]:
        assert answers.join("lab.test", user, canary.text, **more).code == code, machine.ctl("steps").text
    assert answers.join("nowhere.test", "canary", canary.text).code == 2605
    assert answers.join("NT4DOM", "Administrator", canary.text).code in (2607, 2610, 2611)
    with lab.fault("smb-rst", "dc1", only=machine.host):
        assert answers.join("lab.test", "canary", canary.text).code == 2606
    # Refused before anything begins.
    for wrong in ([canary.text], {"x": canary.text}):
        answer = answers.keep(machine.client.call(DOMAIN, 1, "set", {
            "enable_domain": True, "domain_name": "lab.test", "username": "canary", "password": wrong}))
        assert answer.code == 2618
    body = json.dumps({"password": canary.text}).encode()
    assert answers.raw(f"/webapi/{DOMAIN}/1/set", body[:-1]) == 400
    assert answers.raw(f"/webapi/{DOMAIN}/1/nothing", body) == 404
    result = answers.ctl("join", "lab.test", "--user", "canary", "--password-stdin", input=canary.text + "x\n")
    assert result.code == 1, result


def join_and_ignore(machine, canary):
    with contextlib.suppress(ConnectionError, TimeoutError):
        machine.client.join("lab.test", "canary", canary.text)


def crash(machine, canary, name):
    """Joins, and has a program of the join end as after a fault of its own, which would leave its memory behind."""
    machine.must("sh", "-c", "prlimit --core=unlimited --pid $(pgrep -o -x vornd)")
    call = threading.Thread(target=join_and_ignore, args=(machine, canary), daemon=True)
    call.start()
    machine.wait_until(lambda: [process for process in programs(machine, "net") if "join" in process.arguments], 30,
                       "the join's tool")
    for process in programs(machine, name):
        process.signal(signal.SIGSEGV)
    call.join(60)
    assert not call.is_alive()


def test_the_password_is_nowhere(appliance, lab, canary):
    since = time.time() - 20
    answers = Answers(appliance)
    with Sampler(appliance) as sampler:
        fail_at_every_step(appliance, lab, canary, answers)
        give_rights(lab)
        for name in ("net", "vornjoin"):
            crash(appliance, canary, name)
        assert answers.join("lab.test", "canary", canary.text).ok, appliance.ctl("steps").text
        assert appliance.client.test_dc() is True
        assert appliance.client.refresh().ok
        result = answers.ctl("join", "lab.test", "--user", "canary", "--password-stdin", input=canary.text + "\n")
        assert result.code == 0, result
        own = machine_password(appliance)
        assert where(appliance, since, own) == [SECRETS]
        wrong = answers.keep(appliance.client.call(DIRECTORY, 1, "leave", {
            "delete_account": True, "username": "Administrator", "password": canary.text}))
        assert not wrong.ok
        for method, words in (("join_steps", {}), ("users", {"offset": 0, "limit": 1000})):
            answers.keep(appliance.client.call(DIRECTORY, 1, method, words))
        left = answers.keep(appliance.client.call(DIRECTORY, 1, "leave", {
            "delete_account": True, "username": "canary", "password": canary.text}))
        assert left.ok, left.body
        answers.ctl("steps")
        answers.ctl("events")
    assert where(appliance, since, own) == []
    assert where(appliance, since, canary.middle) == []
    assert answers.holding(canary.middle) == []
    assert answers.holding(own) == []
    # It looked often enough to see what lives for some milliseconds.
    assert sampler.passes / sampler.seconds > 20
    assert "net" in sampler.check(canary.middle)
    assert sampler.check(own) == set()
    cores = [path for path, _ in files_written(appliance, since) if re.search(r"/core(\.\d+)?$", path)]
    assert cores == []


def test_what_is_looked_for_would_be_found(appliance, canary):
    """The sampler and the search are worth something: they find a password that is where it must not be."""
    since = time.time() - 20
    with Sampler(appliance) as sampler:
        appliance.must("sh", "-c", "sleep 0.5; echo", "sh", canary.text)
    with pytest.raises(AssertionError, match="in the arguments"):
        sampler.check(canary.middle)
    with Sampler(appliance) as sampler:
        appliance.must("sleep", "0.5", env={"PASSWD": canary.text})
    with pytest.raises(AssertionError, match="in the environment"):
        sampler.check(canary.middle)
    for number, content in enumerate(sorted(spellings(canary.middle))):
        path = f"/var/lib/vorn/{number}"
        appliance.write(path, b"before" + content + b"after")
        assert where(appliance, since, canary.middle) == [path]
        appliance.must("rm", path)
