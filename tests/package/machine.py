"""Machines to install packages on: copy-on-write views of a Debian root, in namespaces of their own, with systemd as the
first process or with nothing that runs. Every wait has a deadline."""

import os
import pathlib
import subprocess
import time

HERE = pathlib.Path(__file__).resolve().parent
OWN_MOUNTS = HERE.parents[1] / "dev.d" / "own_mounts.sh"
ENVIRONMENT = ["/usr/bin/env", "-i", "PATH=/usr/sbin:/usr/bin:/sbin:/bin", "HOME=/root", "LC_ALL=C.UTF-8",
               "DEBIAN_FRONTEND=noninteractive"]


class Result:
    """How a command ended."""

    def __init__(self, words, code, text):
        self.words = words
        self.code = code
        self.text = text

    def __repr__(self):
        return f"{' '.join(map(str, self.words))}: code {self.code}\n{self.text}"


def run(words, deadline=60, input=""):
    """Output and errors in one text, in the order in which they came."""
    done = subprocess.run([str(word) for word in words], input=input.encode(), timeout=deadline, check=False,
                          stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
    return Result(words, done.returncode, done.stdout.decode(errors="backslashreplace"))


def must(words, deadline=60, input=""):
    result = run(words, deadline, input)
    assert result.code == 0, result
    return result.text


def until(condition, seconds, what):
    end = time.monotonic() + seconds
    while not (found := condition()):
        assert time.monotonic() < end, f"not within {seconds} s: {what}"
        time.sleep(0.05)
    return found


class Machine:
    """What it writes is gone when it ends. ROOT is what it stands on, FOLDER its own."""

    def __init__(self, root, folder, kind="systemd"):
        self.folder = pathlib.Path(folder)
        self.folder.mkdir(mode=0o755)
        # It ends with its input, so also when this process is killed.
        self.launcher = subprocess.Popen(
            ["/usr/bin/unshare", "--mount", "--propagation", "unchanged", "/bin/bash", OWN_MOUNTS, "/bin/bash",
             HERE / "launch.sh", root, self.folder, kind], stdin=subprocess.PIPE, stdout=subprocess.DEVNULL, start_new_session=True,
            stderr=(self.folder / "errors").open("wb"))
        try:
            self.wait_until(self.is_itself)
            if kind == "systemd":
                self.wait_until(self.systemd_is_up)
        except BaseException:
            self.end()
            raise

    def end(self):
        self.launcher.stdin.close()
        self.launcher.wait(timeout=60)

    def __enter__(self):
        return self

    def __exit__(self, *_):
        self.end()

    def wait_until(self, condition):
        until(lambda: self.launcher.poll() is not None or condition(), 60, "the machine comes up")
        assert self.launcher.poll() is None, (self.folder / "errors").read_text(encoding="utf-8")

    def is_itself(self):
        """Its first process has left this machine's files behind."""
        ready = self.folder / "ready"
        return ready.exists() and ready.stat().st_size > 0

    def systemd_is_up(self):
        """Whatever is to start at its start runs, or has failed."""
        if not self.path("/run/systemd/private").exists():
            return False
        return self.run("systemctl", "is-system-running").text.strip() in ("running", "degraded")

    @property
    def init(self):
        try:
            return int((self.folder / "init").read_text(encoding="ascii"))
        except (FileNotFoundError, ValueError):
            return 0

    def path(self, path):
        """A file of the machine, as seen from here. Links in it that begin with "/" lead elsewhere."""
        return pathlib.Path(f"/proc/{self.init}/root{path}")

    def run(self, *words, deadline=60, input=""):
        return run(["/usr/bin/nsenter", "--target", self.init, "--mount", "--pid", "--net", "--uts", "--ipc", "--cgroup",
                    "--root", "--wd", "--", "/usr/bin/setpriv", "--pdeathsig", "KILL", "--", *ENVIRONMENT, *words],
                   deadline, input)

    def must(self, *words, deadline=60, input=""):
        result = self.run(*words, deadline=deadline, input=input)
        assert result.code == 0, result
        return result.text

    def start(self, *words):
        """Goes on by itself, in the machine."""
        self.must("/bin/sh", "-c", 'setsid "$@" </dev/null >/run/started.log 2>&1 &', "start", *words)

    def curl(self, *words, deadline=30):
        """This machine's curl, in the network of the machine."""
        return run(["/usr/bin/nsenter", "--target", self.init, "--net", "--", "/usr/bin/curl", "--silent", "--show-error",
                    "--insecure", "--noproxy", "*", "--max-time", deadline, *words], deadline + 10)

    # Packages.

    def put(self, *files):
        """Copies of the files, where the machine's apt finds them; answers their paths there."""
        folder = self.path("/opt/packages")
        folder.mkdir(exist_ok=True)
        for file in files:
            (folder / file.name).write_bytes(file.read_bytes())
        return [f"/opt/packages/{file.name}" for file in files]

    def install(self, *files):
        """Without a network: whatever they need is there. A question about a changed file gets its usual answer."""
        return self.must("apt-get", "-q", "install", "-y", "--no-install-recommends", "-o",
                         "Dpkg::Options::=--force-confdef", *self.put(*files), deadline=180)

    def apt(self, action, *names):
        return self.must("apt-get", "-q", action, "-y", *names, deadline=400)

    def unit(self, name, *properties):
        """Properties of a unit, as systemd shows them."""
        text = self.must("systemctl", "show", name, *(f"--property={key}" for key in properties))
        return dict(line.split("=", 1) for line in text.splitlines())

    def arguments(self, unit):
        """The command line of a service's main process; empty when there is none."""
        pid = self.unit(unit, "MainPID")["MainPID"]
        if pid == "0":
            return []
        return self.path(f"/proc/{pid}/cmdline").read_bytes().decode().split("\0")[:-1]

    def journal(self):
        return self.run("journalctl", "--no-pager", "--lines", "200").text


def processes_of(machine, folder):
    """The programs of a folder that run on the machine, by their paths."""
    found = []
    for entry in machine.path("/proc").iterdir():
        if entry.name.isdigit():
            try:
                program = os.readlink(entry / "exe")
            except OSError:
                continue
            if program.startswith(folder):
                found.append(program)
    return sorted(found)
