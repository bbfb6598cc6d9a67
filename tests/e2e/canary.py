"""What the tests of secrets look with: a password that stands nowhere else, and files, processes and answers in which it
may not be."""

import base64
import contextlib
import json
import os
import pathlib
import re
import secrets
import subprocess
import threading
import time

from processes import processes

# What the appliance hands the password to by the environment, which nobody but root can read. "timeout" is what ends
# the join's own tool should its caller die.
TOOLS = {"net", "rpcclient", "timeout"}
VARIABLE = "PASSWD"
WRITABLE = ("var", "run", "etc", "usr/vorn", "tmp", "home", "srv", "opt", "dev/shm")
# The domains that the lab keeps for the next time.
FOREIGN = ("/var/cache/vorn-lab",)
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
    # Of what the machine's own administrator has, which is a lot and none of a program's, the top alone.
    for tops, depth in (([f"{root}/{top}" for top in WRITABLE], []), ([f"{root}/root"], ["-maxdepth", "1"])):
        foreign = [word for path in FOREIGN for word in ("-path", root + path, "-prune", "-o")]
        found = subprocess.run(["find", *tops, *depth, *foreign, "-type", "f", "-newerct", f"@{since}", "-print0"],
                               stdout=subprocess.PIPE, stderr=subprocess.DEVNULL, timeout=60)
        for path in found.stdout.decode(errors="surrogateescape").split("\0")[:-1]:
            with contextlib.suppress(OSError):  # gone meanwhile
                yield path.removeprefix(root), pathlib.Path(path).read_bytes()


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
                if may_hold(program, environment.split(b"\0"), plain):
                    assert owner is None or not owner[2] or owner == (0, "0o400", ["0"] * 4), owner
                    seen.add(os.path.basename(program))
        return seen


def may_hold(program, environment, plain):
    """Does the environment hold the text? Then it is that of a tool, and in the variable that is meant for it."""
    found = [entry for entry in environment if plain in entry]
    for entry in found:
        assert entry.startswith(VARIABLE.encode() + b"="), f"{program}: {entry!r}"
        assert os.path.basename(program).removesuffix(".kept") in TOOLS | {""}, f"in the environment of {program}"
    return bool(found)


def check_programs(begun, *texts):
    """What ExecWatch saw begin: where the texts may not be, they are not; answers in which programs they are."""
    seen = set()
    for text in texts:
        for program in begun:
            assert not any(text in word for word in program["arguments"]), f"in the arguments of {program}"
            if may_hold(program["program"], [entry.encode() for entry in program["environment"]], text.encode()):
                seen.add(os.path.basename(program["program"]))
    return seen


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
