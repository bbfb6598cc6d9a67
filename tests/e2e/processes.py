"""The processes of a host of the lab, seen and ended from outside of it, so that nothing in the host takes part."""

import contextlib
import os
import signal


class Process:
    """One process, by its folder under the host's own /proc. What has ended shows as empty."""

    def __init__(self, proc, pid):
        self.pid = pid
        self.folder = f"{proc}/{pid}"

    def read(self, name):
        try:
            with open(f"{self.folder}/{name}", "rb") as file:
                return file.read()
        except (FileNotFoundError, ProcessLookupError):
            return b""

    @property
    def program(self):
        """The path of its program; empty for a thread of the kernel and for what has ended."""
        try:
            return os.readlink(f"{self.folder}/exe").removesuffix(" (deleted)")
        except OSError:
            return ""

    @property
    def name(self):
        return os.path.basename(self.program)

    @property
    def arguments(self):
        return [word.decode(errors="backslashreplace") for word in self.read("cmdline").split(b"\0")[:-1]]

    def status(self, key):
        """A line of /proc/PID/status, as words."""
        for line in self.read("status").decode(errors="backslashreplace").splitlines():
            name, _, value = line.partition(":")
            if name == key:
                return value.split()
        return []

    @property
    def parent(self):
        return int((self.status("PPid") or ["0"])[0])

    @property
    def state(self):
        return (self.status("State") or ["X"])[0]

    def signal(self, number):
        with contextlib.suppress(OSError):
            folder = os.open(self.folder, os.O_RDONLY | os.O_DIRECTORY)
            try:
                signal.pidfd_send_signal(folder, number)
            finally:
                os.close(folder)


def processes(machine):
    proc = str(machine.path("/proc"))
    return [Process(proc, int(name)) for name in os.listdir(proc) if name.isdigit()]


def programs(machine, *names):
    return [process for process in processes(machine) if process.name in names]


def loggers(machine):
    """The system's logger."""
    return [process for process in processes(machine) if process.arguments[:2] == ["busybox", "syslogd"]]


def tasks(machine):
    """The processes of background tasks."""
    return [process for process in programs(machine, "vornd") if process.arguments[1:2] == ["--task"]]


def wait_for_tasks(machine):
    """A task tells its result first, then it takes its marker away and ends, and counts as running until then."""
    machine.wait_until(lambda: not tasks(machine), 20, "the end of the task")


def kill(chosen):
    """Ends all processes that `chosen` answers at one moment: they are stopped first, those that they start as well."""
    stopped = {}
    while True:
        more = [process for process in chosen() if process.pid not in stopped]
        if not more:
            break
        for process in more:
            process.signal(signal.SIGSTOP)
            stopped[process.pid] = process
    for process in stopped.values():
        process.signal(signal.SIGKILL)
    return list(stopped.values())


@contextlib.contextmanager
def held(chosen):
    """The processes that `chosen` answers stand still: what the block does happens in the middle of their work."""
    stopped = {}
    try:
        for _ in range(3):
            for process in chosen():
                if process.pid not in stopped:
                    process.signal(signal.SIGSTOP)
                    stopped[process.pid] = process
        yield stopped
    finally:
        for process in stopped.values():
            process.signal(signal.SIGCONT)
