"""What is easily overlooked, on a member: the settings of a join, the pid files of a fetch, how children are waited
for, the name check's tool."""

import re

from client import SCHEDULE
from lab import PROJECT, password
from obstacles import away, files_under

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
SETTINGS = "/etc/vorninfo.conf"
PID_FILES = ("/tmp/domain_user.pid", "/tmp/domain_group.pid")


def test_a_join_records_its_name_servers_until_the_leave(joined):
    assert joined.read(SETTINGS).splitlines()[-1] == b"domain_dns=10.77.0.10"
    assert joined.client.leave().ok
    assert b"domain_dns" not in joined.read(SETTINGS)
    assert joined.client.join("lab.test", *ADMINISTRATOR, dns="10.77.0.10,10.77.0.30").ok
    assert b"domain_dns=10.77.0.10,10.77.0.30\n" in joined.read(SETTINGS)
    # Where the lab's controller alone serves names again.
    assert joined.client.join("lab.test", *ADMINISTRATOR, dns="10.77.0.10").ok


def test_a_rewrite_of_the_configuration_keeps_the_switch_of_the_clock(joined):
    joined.client.options(enable_sync_time=True)
    assert b"vorn sync dctime = yes\n" in joined.read("/usr/vorn/etc/smb.conf")
    assert joined.client.join("lab.test", *ADMINISTRATOR).ok
    assert joined.client.options()["enable_sync_time"] is True
    joined.client.options(enable_sync_time=False)


def test_the_keys_of_a_domain_are_written_in_lower_case_and_only_when_known(joined):
    lines = [line.strip() for line in joined.read("/usr/vorn/etc/smb.conf").decode().splitlines()]
    assert "security = ads" in lines
    assert "realm = LAB.TEST" in lines
    assert "workgroup = LAB" in lines
    assert not any(line.startswith("password server") for line in lines)


def test_a_fetch_of_vornwin_writes_pid_files_and_never_the_marker(joined):
    script = "vornwin -updateDomain & while [ -d /proc/$! ]; do ls /tmp; done; wait $!; echo ended with $?"
    result = joined.must("sh", "-c", script, deadline=120)
    assert "ended with 0" in result.out, result
    for path in PID_FILES:
        assert path.rpartition("/")[2] in result.out.split(), result
        assert not joined.exists(path)
    assert "domain_updating" not in result.out


def test_no_child_is_lost_to_its_waiter(joined):
    """SIGCHLD is not ignored, and nobody waits for whatever child ends: system() would then fail."""
    pid = joined.must("sh", "-c", "pgrep -o -x vornd").out.strip()
    status = joined.path(f"/proc/{pid}/status").read_text()
    ignored = int(re.search(r"^SigIgn:\s*([0-9a-f]+)$", status, re.M).group(1), 16)
    assert not ignored & 1 << 16
    any_child = re.compile(r"\bwait(3|4|id|pid)?\s*\(\s*(-1|P_ALL|nullptr|&)|SIGCHLD\s*,\s*SIG_IGN|SA_NOCLDWAIT")
    for file in [*PROJECT.glob("appliance/**/*.cpp"), *PROJECT.glob("src/**/*.cpp")]:
        assert not any_child.search(file.read_text(encoding="utf-8")), file


def test_the_name_check_finds_a_name_that_exists(joined):
    wrong = {"user": "Administrator", "password": "not the passw0rd", "dns": "10.77.0.10,10.77.0.1"}
    assert joined.client.join("lab.test", **wrong).code == 2607
    with away(joined, "/usr/bin/nslookup"):
        assert joined.client.join("lab.test", **wrong).code == 2602
    assert "private" in {path.split("/")[4] for path in files_under(joined, "/usr/vorn/etc") if path.count("/") > 4}


def test_a_schedule_left_over_goes_when_it_is_set_without_a_domain(joined):
    client = joined.client
    assert client.call(SCHEDULE, 1, "set", {"date_type": 0, "week_name": "1", "hour": 3, "min": 4}).ok
    assert client.leave().ok
    answer = client.call(SCHEDULE, 1, "set", {"date_type": 0, "week_name": "2", "hour": 3, "min": 4})
    assert answer.code == 2624, answer.body
    assert client.schedule() == {"date_type": 2}
    assert not joined.exists("/etc/cron.d/vorn") or b"updateDomain" not in joined.read("/etc/cron.d/vorn")
    assert client.get() == {"enable_domain": False}
