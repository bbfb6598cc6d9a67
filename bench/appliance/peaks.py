"""Memory of the appliance's processes, in bytes. A host's own /proc holds its processes alone."""

import os
import threading
import time

from machine import Wrong

KIB = 1024
LOOK_SECONDS = 0.02  # for processes that are new
SAMPLE_SECONDS = 0.001


def values(path):
    """The lines "Name:  123 kB" of a file of /proc, in bytes."""
    found = {}
    for line in path.read_text(encoding="ascii").splitlines():
        name, _, rest = line.partition(":")
        words = rest.split()
        if len(words) == 2 and words[1] == "kB":
            found[name] = int(words[0]) * KIB
    return found


def memory(machine, pid):
    rollup = values(machine.path(f"/proc/{pid}/smaps_rollup"))
    return {"pss": rollup["Pss"], "rss": rollup["Rss"], "private": rollup["Private_Clean"] + rollup["Private_Dirty"]}


class Peaks:
    """Watches the processes of background tasks, those that run within the block, for the most memory that each had.

    The kernel keeps the peak itself; what is lost is what a process took in its last moment, at most SAMPLE_SECONDS.
    """

    def __init__(self, machine):
        self.folder = machine.path("/proc")
        self.peaks = {}
        self.ending = threading.Event()
        self.thread = threading.Thread(target=self.watch, daemon=True)

    def __enter__(self):
        self.thread.start()
        return self

    def __exit__(self, *error):
        self.ending.set()
        self.thread.join()

    @property
    def highest(self):
        if not self.peaks:
            raise Wrong("no process of a task was seen")
        return max(self.peaks.values())

    def tasks(self):
        """Open status files of the processes of tasks."""
        files = {}
        for name in os.listdir(self.folder):
            if name.isdigit():
                try:
                    if b"\0--task\0" in (self.folder / name / "cmdline").read_bytes():
                        files[name] = os.open(self.folder / name / "status", os.O_RDONLY)
                except (FileNotFoundError, ProcessLookupError):
                    pass
        return files

    def watch(self):
        files = {}
        look = 0.0
        while not self.ending.is_set():
            if time.monotonic() >= look:
                for descriptor in files.values():
                    os.close(descriptor)
                files = self.tasks()
                look = time.monotonic() + LOOK_SECONDS
            for name, descriptor in files.items():
                try:
                    text = os.pread(descriptor, 4096, 0)
                except ProcessLookupError:
                    continue
                place = text.find(b"VmHWM:")
                if place >= 0:  # one that has ended, but was not collected, has none
                    self.peaks[name] = max(self.peaks.get(name, 0), int(text[place + 6:].split()[0]) * KIB)
            time.sleep(SAMPLE_SECONDS)
        for descriptor in files.values():
            os.close(descriptor)
