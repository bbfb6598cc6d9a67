"""Follows a process and all that it starts, and tells of every program that is begun: its arguments and its
environment, as they are before its first instruction, however briefly it lives.

As a program: exec_watch.py PID, as root. "ready" comes first; then a line of JSON for each program, until the input
ends; "done" is the last line."""

import ctypes
import json
import os
import signal
import subprocess
import sys
import threading

SEIZE, CONTINUE, LISTEN = 0x4206, 7, 0x4208
# What it forks and clones is followed as well, and each program that is begun stops.
OPTIONS = 1 << 1 | 1 << 2 | 1 << 3 | 1 << 4
EVENT_EXEC, EVENT_STOP = 4, 128
WALL = 0x40000000
GROUP_STOPS = (signal.SIGSTOP, signal.SIGTSTP, signal.SIGTTIN, signal.SIGTTOU)

telling = threading.Lock()
libc = ctypes.CDLL(None, use_errno=True)
libc.ptrace.argtypes = [ctypes.c_long, ctypes.c_long, ctypes.c_void_p, ctypes.c_void_p]
libc.ptrace.restype = ctypes.c_long


def ptrace(request, thread, data=0):
    return libc.ptrace(request, thread, None, data)


def words(pid, name):
    with open(f"/proc/{pid}/{name}", "rb") as file:
        return [word.decode(errors="backslashreplace") for word in file.read().split(b"\0")[:-1]]


def tell(thread):
    try:
        begun = {"arguments": words(thread, "cmdline"), "environment": words(thread, "environ"),
                 "program": os.readlink(f"/proc/{thread}/exe")}
    except OSError as error:  # killed in this very moment
        begun = {"arguments": [], "environment": [], "program": "", "error": str(error)}
    print(json.dumps(begun), flush=True)


def resume(thread, status):
    event, number = status >> 16, os.WSTOPSIG(status)
    if event == EVENT_EXEC:
        tell(thread)
    if event == EVENT_STOP and number in GROUP_STOPS:
        ptrace(LISTEN, thread)
    else:
        ptrace(CONTINUE, thread, 0 if event else number)


def seize(pid):
    """All its threads, also those that begin meanwhile."""
    known = set()
    while True:
        fresh = {int(name) for name in os.listdir(f"/proc/{pid}/task")} - known
        if not fresh:
            return
        for thread in fresh:
            # One that a seized thread has begun is followed already.
            ptrace(SEIZE, thread, OPTIONS)
        known |= fresh


def follow():
    """Until nothing is left that could be followed."""
    while True:
        try:
            thread, status = os.waitpid(-1, WALL)
        except ChildProcessError:
            return
        if os.WIFSTOPPED(status):
            with telling:
                resume(thread, status)


def end_with_input():
    sys.stdin.read()
    with telling:
        print("done", flush=True)
        os._exit(0)  # what is followed goes on without this process


class ExecWatch:
    """What a process of a host and all that it starts begin while the block lasts."""

    def __init__(self, process):
        # As this machine counts; the process knows its number in its own namespace only.
        self.pid = next(int(name) for name in os.listdir("/proc")
                        if name.isdigit() and same(f"/proc/{name}", process.folder))
        self.begun = []

    def __enter__(self):
        self.watcher = subprocess.Popen([sys.executable, __file__, str(self.pid)], stdin=subprocess.PIPE,
                                        stdout=subprocess.PIPE)
        assert self.watcher.stdout.readline() == b"ready\n"
        # Read at once: with a full pipe the watcher would stand still, and all that it follows.
        self.lines = []
        self.reader = threading.Thread(target=lambda: self.lines.extend(self.watcher.stdout), daemon=True)
        self.reader.start()
        return self

    def __exit__(self, *_):
        self.watcher.stdin.close()
        code = self.watcher.wait(20)
        self.reader.join(20)
        assert self.lines and self.lines[-1] == b"done\n" and code == 0, (code, self.lines)
        self.begun = [json.loads(line) for line in self.lines[:-1]]


def same(one, other):
    """Are these two views of one process?"""
    def key(folder):
        with open(f"{folder}/stat", "rb") as file:
            started = file.read().rpartition(b")")[2].split()[19]
        return started, os.readlink(f"{folder}/ns/pid"), status_pid(folder)

    def status_pid(folder):
        with open(f"{folder}/status", encoding="utf-8", errors="replace") as file:
            return next(line.split()[-1] for line in file if line.startswith("NSpid:"))

    try:
        return key(one) == key(other)
    except OSError:
        return False


if __name__ == "__main__":
    seize(int(sys.argv[1]))
    print("ready", flush=True)
    threading.Thread(target=end_with_input).start()
    follow()
