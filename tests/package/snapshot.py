"""All that lies on a machine's disk: paths, kinds, owners, modes, contents."""

import contextlib
import hashlib
import os
import re
import stat

# Mounted, and nothing of the disk.
LEFT_OUT = ("/proc", "/sys", "/dev", "/run", "/tmp")

# What any installation and any run of a machine leaves: the bookkeeping of Debian's own tools, logs, and the databases of
# Samba's daemons. That nothing of the packages lies there under a name of theirs is looked for apart.
BOOKKEEPING = re.compile(
    r"/var/log/(apt|journal|samba)/.*|/var/log/(dpkg|alternatives)\.log|/var/log/(lastlog|wtmp|btmp|faillog)"
    r"|/var/lib/dpkg/(status|status-old|lock|lock-frontend|triggers/(File|Lock|Unincorp)|diversions.*)"
    r"|/var/lib/apt/(extended_states|lists/lock|lists/partial)|/var/cache/(apt|ldconfig|man)(/.*)?"
    r"|/var/(lib|cache)/samba/.*"
    # Backups that the tools for accounts make of what was there before.
    r"|/etc/(passwd|group|shadow|gshadow|subuid|subgid)-|/etc/\.pwd\.lock")

# What systemd writes besides, where it runs.
SYSTEMD = re.compile(r"/var/lib/systemd/.*|/var/tmp/systemd-private-.*")


def snapshot(machine):
    """A description for each path."""
    top = str(machine.path("/"))
    found = {}
    for folder, names, files in os.walk(top):
        shown = "/" + os.path.relpath(folder, top)
        shown = "/" if shown == "/." else shown
        names[:] = [name for name in names if os.path.join(shown, name) not in LEFT_OUT]
        for name in [*names, *files]:
            path = os.path.join(folder, name)
            # On a machine that runs, files come and go.
            with contextlib.suppress(FileNotFoundError):
                found[os.path.join(shown, name)] = describe(path)
    return found


def describe(path):
    status = os.lstat(path)
    what = f"{stat.filemode(status.st_mode)} {status.st_uid}:{status.st_gid}"
    if stat.S_ISLNK(status.st_mode):
        return f"{what} -> {os.readlink(path)}"
    if stat.S_ISREG(status.st_mode):
        with open(path, "rb") as file:
            return f"{what} {status.st_size} {hashlib.file_digest(file, 'sha256').hexdigest()}"
    return what


def differences(before, after, systemd=False):
    """What came, went or changed, but for what the machine's own tools and services write."""
    lines = []
    for path in sorted(before.keys() | after.keys()):
        old, new = before.get(path), after.get(path)
        if old != new and not BOOKKEEPING.fullmatch(path) and not (systemd and SYSTEMD.fullmatch(path)):
            lines.append(f"{path}: {old} is now {new}")
    return lines


def named(found, word):
    """The paths that hold a word."""
    return sorted(path for path in found if word in path)
