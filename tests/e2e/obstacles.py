"""What is put in an appliance's way: full and read-only folders, programs that are missing, files that are damaged.
Each is gone again at the end of its block."""

import contextlib
import pathlib
import subprocess

from lab import COMMAND

SMALL_DISK = """set -e
mkdir -p /mnt/small
mount -t tmpfs -o size=16m small /mnt/small
chmod --reference="$1" /mnt/small
cp -a "$1/." /mnt/small
mount --move /mnt/small "$1"
"""
FILL = """room=$2
head -c 32000000 /dev/zero >"$1/filler" 2>/dev/null
[ "$room" = 0 ] || truncate -s "-$room" "$1/filler"
"""


def small_disk(machine, folder):
    """Puts the folder on a disk of its own for the rest of the machine's life; vornd must not run meanwhile."""
    machine.must("sh", "-c", SMALL_DISK, "small-disk", folder)


@contextlib.contextmanager
def full(machine, folder, room=0):
    """A folder of small_disk without room for more than ROOM bytes."""
    machine.exec("sh", "-c", FILL, "fill", folder, str(room))
    try:
        yield
    finally:
        machine.must("rm", f"{folder}/filler")


@contextlib.contextmanager
def read_only(machine, folder):
    machine.must("mount", "--bind", folder, folder)
    try:
        machine.must("mount", "-o", "remount,ro,bind", folder)
        yield
    finally:
        # Some daemon of the machine may have a file of it open at this moment.
        machine.must("umount", "--lazy", folder)


@contextlib.contextmanager
def away(machine, *paths):
    """Files that are not there."""
    moved = []
    try:
        for path in paths:
            machine.must("mv", "-T", path, path + ".away")
            moved.append(path)
        yield
    finally:
        for path in moved:
            machine.must("mv", "-T", path + ".away", path)


@contextlib.contextmanager
def replaced(machine, path, command):
    """The file is what COMMAND, a line of shell that knows it as "$1", makes of it; afterwards it is as it was."""
    kept = path + ".kept"
    machine.must("cp", "-a", path, kept)
    try:
        machine.must("sh", "-c", command, "damage", path)
        yield
    finally:
        machine.must("rm", "-rf", path)
        machine.must("mv", "-T", kept, path)


def files_under(machine, *folders):
    """The names and the content of all regular files."""
    found = {}
    for folder in folders:
        top = machine.path(folder)
        for file in top.rglob("*"):
            if file.is_file() and not file.is_symlink() and file.name != "filler":
                found[f"{folder}/{file.relative_to(top)}"] = file.read_bytes()
    return found


@contextlib.contextmanager
def without_trust(machine):
    """Samba's tool of this name, but that winbind never confirms the membership."""
    command = r"""printf '%s\n' '#!/bin/sh' 'case "$*" in *--check-secret*) exit 1 ;; esac' \
        'exec /usr/bin/wbinfo.kept "$@"' >"$1" """
    with replaced(machine, "/usr/bin/wbinfo", command):
        yield


@contextlib.contextmanager
def name_server(machine, mode):
    """Answers at 127.0.0.53 of the appliance for LAB.TEST, as odd_dns.py tells of that mode."""
    script = pathlib.Path(__file__).with_name("odd_dns.py").read_text(encoding="utf-8")
    process = subprocess.Popen(
        [COMMAND, "exec", machine.host, "python3", "-c", script, "127.0.0.53", "10.77.0.10", mode],
        env={**machine.lab.env, "PATH": "/usr/bin:/bin"}, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE)
    try:
        assert process.stdout.readline() == b"ready\n"
        yield
    finally:
        process.kill()
        process.wait(timeout=10)
        process.stdout.close()


class Log:
    """What the system log says from here on."""

    def __init__(self, machine):
        self.machine = machine
        self.begin = len(machine.syslog())

    @property
    def lines(self):
        """Of the appliance's own programs."""
        text = self.machine.syslog()[self.begin:]
        return [line for line in text.splitlines() if any(f" {name}[" in line for name in PROGRAMS)]

    def says(self, *parts):
        """One line holds all the parts. The system log writes a moment after it was told."""
        return any(all(part in line for part in parts) for line in self.lines)


PROGRAMS = ("vornd", "vornjoin", "vornwin")
