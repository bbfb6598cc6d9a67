"""The lab as an object: brings it up and down, runs commands in its hosts, makes faults. Every wait has a deadline."""

import contextlib
import os
import pathlib
import signal
import subprocess
import time

PROJECT = pathlib.Path(__file__).resolve().parents[2]
COMMAND = PROJECT / "lab" / "lab"
ACCOUNTS = PROJECT / "lab" / "accounts.conf"


class DeadlinePassed(Exception):
    """A command took too long, and was ended with all that it had started."""


class Failed(Exception):
    """A command of the lab itself failed."""


class Result:
    """How a command ended: exit code (below 0: the signal), texts, seconds."""

    def __init__(self, command, code, out, err, seconds):
        self.command = command
        self.code = code
        self.out = out
        self.err = err
        self.seconds = seconds

    @property
    def text(self):
        return self.out + self.err

    def __repr__(self):
        return f"{self.command}: code {self.code} after {self.seconds:.2f} s\nout: {self.out}\nerr: {self.err}"


def run(command, deadline, input=None, env=None):
    """Runs a command in a group of processes of its own. Output that is no UTF-8 shows as backslash escapes."""
    begin = time.monotonic()
    process = subprocess.Popen(
        [str(word) for word in command], stdin=subprocess.PIPE, stdout=subprocess.PIPE, stderr=subprocess.PIPE,
        env={**os.environ, **(env or {})}, start_new_session=True)
    data = input.encode() if isinstance(input, str) else input
    try:
        out, err = process.communicate(data or b"", timeout=deadline)
    except BaseException as error:
        with contextlib.suppress(ProcessLookupError):
            os.killpg(process.pid, signal.SIGKILL)
        out, err = process.communicate()
        if isinstance(error, subprocess.TimeoutExpired):
            text = f"{command} did not end within {deadline} s\nout: {out!r}\nerr: {err!r}"
            raise DeadlinePassed(text) from None
        raise
    texts = [stream.decode(errors="backslashreplace") for stream in (out, err)]
    return Result(" ".join(map(str, command)), process.returncode, *texts, time.monotonic() - begin)


def accounts():
    """The users of the lab's domains: a list of dicts with domain, name, password, state and groups."""
    users = []
    for line in ACCOUNTS.read_text(encoding="utf-8").splitlines():
        fields = [field.strip() for field in line.split("|")]
        if fields[0] == "user":
            users.append(dict(zip(("domain", "name", "password", "state", "display", "groups"), fields[1:])))
    return users


def password(domain, name):
    return next(user["password"] for user in accounts() if (user["domain"], user["name"]) == (domain, name))


class Lab:
    """One lab in a folder of its own; FOLDER need not exist. CACHE: None takes the machine's own."""

    def __init__(self, folder, cache=None):
        self.folder = pathlib.Path(folder)
        self.env = {"LAB_DIR": str(folder)}
        if cache:
            self.env["LAB_CACHE"] = str(cache)

    def command(self, *words, deadline=60, input=None, env=None):
        """Any command of the lab; how it ended is the caller's to judge."""
        return run([COMMAND, *words], deadline, input, {**self.env, **(env or {})})

    def must(self, *words, deadline=60):
        result = self.command(*words, deadline=deadline)
        if result.code != 0:
            raise Failed(repr(result))
        return result

    def up(self, *options, deadline=600):
        """The lab ends with this process, however that ends."""
        return self.must("up", "--with-pid", os.getpid(), *options, deadline=deadline)

    def down(self):
        return self.must("down", deadline=60)

    def exec(self, host, *words, deadline=60, input=None, env=None):
        return self.command("exec", host, *words, deadline=deadline, input=input, env=env)

    def write(self, host, path, text):
        result = self.exec(host, "sh", "-c", 'cat >"$1"', "write", path, input=text)
        if result.code != 0:
            raise Failed(repr(result))

    def init(self, host):
        """The process that holds the host, as this machine counts."""
        return int((self.folder / "hosts" / host / "init").read_text().split()[0])

    def root(self, host):
        """The host's files, as seen from this machine."""
        return pathlib.Path(f"/proc/{self.init(host)}/root")

    def address(self, host):
        return (self.folder / "hosts" / host / "address").read_text().strip()

    @contextlib.contextmanager
    def fault(self, name, controller="dc1", only=None):
        """The fault lasts as long as the block; ONLY names the one host that is to see it."""
        try:
            self.must("fault", name, controller, *(["--from", only] if only else []))
            yield
        finally:
            self.must("fault", "none", controller)

    @contextlib.contextmanager
    def frozen(self, controller="dc1"):
        self.must("freeze", controller)
        try:
            yield
        finally:
            self.must("thaw", controller)

    @contextlib.contextmanager
    def killed(self, controller="dc1"):
        self.must("kill-dc", controller)
        try:
            yield
        finally:
            self.must("start-dc", controller, deadline=90)

    def vornd(self, host, action):
        return self.must("vornd", host, action)
