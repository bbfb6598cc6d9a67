"""What a local user puts under the names that a refresh uses in /tmp: it stops no refresh and is believed by nobody."""

import pytest

from client import DIRECTORY
from obstacles import Log
from processes import wait_for_tasks

MARKER = "/tmp/domain_updating"
PID_FILES = ("/tmp/domain_user.pid", "/tmp/domain_group.pid")
VICTIM = "/etc/hosts"


def as_guest(machine, script):
    """Any user of the appliance may write to /tmp."""
    machine.must("setpriv", "--reuid=guest", "--regid=nogroup", "--clear-groups", "sh", "-c", script)


def progress(machine):
    return machine.client.call(DIRECTORY, 1, "refresh_progress").data


@pytest.mark.parametrize("script", [
    f"touch {MARKER}",
    f"ln -s {VICTIM} {MARKER}",
    f"mkfifo {MARKER}",
    f"mkdir {MARKER} && touch {MARKER}/in-it",
], ids=["file", "link", "fifo", "folder"])
def test_a_marker_of_another_user_stops_no_refresh(joined, script):
    log = Log(joined)
    victim = joined.path(VICTIM).stat()
    before = progress(joined)
    as_guest(joined, script)
    shown = progress(joined)
    assert shown == before and not (shown or {}).get("running")
    assert joined.client.refresh("LAB").data == {"status": "finish"}
    wait_for_tasks(joined)
    assert not joined.exists(MARKER) and not joined.path(MARKER).is_symlink()
    assert log.says(MARKER, "was in the way", "has been removed")
    after = joined.path(VICTIM).stat()
    assert (after.st_ino, after.st_mtime_ns, after.st_uid) == (victim.st_ino, victim.st_mtime_ns, victim.st_uid)


def test_pid_files_of_another_user_are_not_believed(joined):
    pid = joined.must("sh", "-c", "pgrep -o -x vornd").out.strip()
    as_guest(joined, "; ".join(f"echo {pid} >{path}" for path in PID_FILES))
    assert not (progress(joined) or {}).get("running")
    assert joined.client.refresh("LAB").data == {"status": "finish"}
    wait_for_tasks(joined)
    for path in PID_FILES:
        assert not joined.exists(path)
