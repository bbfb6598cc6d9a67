"""The packages on a machine that systemd runs: units, Samba's configuration, log-in, and a page for the browser."""

import json
import re
import time

import pytest

from machine import processes_of, until

MACHINE = "systemd"
CONFIGURATION = "--configfile=/usr/vorn/etc/smb.conf"


@pytest.fixture(scope="module", name="installed")
def installed_machine(machine, packages):
    assert CONFIGURATION not in machine.arguments("smbd.service")
    machine.install(*packages.values())
    return machine


def is_active(machine, unit):
    return machine.run("systemctl", "is-active", unit).text.strip()


@pytest.mark.parametrize("unit", ["vornd.service", "vorn-httpd.service"])
def test_the_services_run_and_start_with_the_machine(installed, unit):
    assert is_active(installed, unit) == "active", installed.journal()
    assert installed.must("systemctl", "is-enabled", unit).strip() == "enabled"
    shown = installed.unit(unit, "Type", "NotifyAccess", "StatusText", "NRestarts", "WatchdogUSec")
    assert shown["Type"] == "notify" and shown["NRestarts"] == "0"
    assert shown["WatchdogUSec"] not in ("0", "infinity")


@pytest.mark.parametrize("unit", ["vornd.service", "vorn-httpd.service", "smbd.service", "nmbd.service", "winbind.service"])
def test_the_units_are_valid(installed, unit):
    text = installed.must("systemd-analyze", "verify", "--man=no", unit)
    assert "vorn" not in text, text


def test_every_service_of_the_machine_is_well(installed):
    failed = installed.must("systemctl", "list-units", "--failed", "--plain", "--no-legend")
    assert not re.search("vorn|smbd|nmbd|winbind|samba", failed), failed


@pytest.mark.parametrize("unit", ["smbd.service", "nmbd.service"])
def test_sambas_services_read_the_appliances_configuration(installed, unit):
    assert is_active(installed, unit) == "active", installed.journal()
    assert CONFIGURATION in installed.arguments(unit)
    assert f"/lib/systemd/system/{unit}.d/vorn.conf" in installed.must("systemctl", "cat", unit)


def test_winbindd_does_not_run_on_a_machine_that_is_no_member(installed):
    assert is_active(installed, "winbind.service") == "inactive"
    assert installed.unit("winbind.service", "Result")["Result"] in ("success", "exec-condition")


def test_winbindd_and_nmbd_run_where_the_configuration_has_a_place_for_them(installed):
    conf = installed.path("/usr/vorn/etc/smb.conf")
    text = conf.read_text(encoding="utf-8")
    try:
        member = text.replace("security = user", "security = domain\n    disable netbios = yes")
        assert member != text
        conf.write_text(member, encoding="utf-8")
        installed.must("systemctl", "restart", "nmbd.service")
        assert is_active(installed, "nmbd.service") == "inactive"
        installed.run("systemctl", "start", "winbind.service")
        tried = installed.unit("winbind.service", "ExecMainStartTimestampMonotonic")["ExecMainStartTimestampMonotonic"]
        assert tried != "0", "the condition kept winbindd away"
    finally:
        conf.write_text(text, encoding="utf-8")
        installed.run("systemctl", "stop", "winbind.service")
        installed.run("systemctl", "reset-failed", "winbind.service")
        installed.must("systemctl", "restart", "nmbd.service")
    assert is_active(installed, "nmbd.service") == "active"


def test_the_configuration_is_there_before_samba_needs_it(installed):
    before = installed.path("/usr/vorn/share/defaults/smb.conf").read_bytes()
    conf = installed.path("/usr/vorn/etc/smb.conf")
    assert conf.read_bytes() == before and conf.stat().st_mode & 0o777 == 0o644
    installed.must("systemctl", "stop", "vornd.service", "smbd.service")
    conf.unlink()
    installed.must("systemd-tmpfiles", "--create", "--boot")
    installed.must("systemctl", "start", "smbd.service")
    assert conf.read_bytes() == before
    installed.must("systemctl", "start", "vornd.service", "vorn-httpd.service")


def test_the_command_line_is_on_the_path_with_manual_and_completion(installed):
    assert installed.must("sh", "-c", "command -v vornctl").strip() == "/usr/bin/vornctl"
    text = installed.must("vornctl", "status")
    assert re.search("not a member|no member", text), text
    assert installed.path("/usr/share/bash-completion/completions/vornctl").is_file()
    assert installed.path("/usr/share/man/man1/vornctl.1.gz").is_file()


def test_vornd_serves_both_modules(installed):
    listed = json.loads(installed.must("/usr/bin/python3", "-c", "\n".join([
        "import socket, sys",
        "s = socket.socket(socket.AF_UNIX)",
        "s.settimeout(20)",
        "s.connect('/run/vorn/vornd.sock')",
        "s.sendall(b'GET /webapi HTTP/1.1\\r\\nHost: localhost\\r\\nConnection: close\\r\\n\\r\\n')",
        "data = b''",
        "while piece := s.recv(65536): data += piece",
        "sys.stdout.write(data.partition(b'\\r\\n\\r\\n')[2].decode())"])))
    text = json.dumps(listed)
    assert "VORN.Core.Directory.Domain" in text and "VORN.Appliance." in text


def test_the_user_and_the_group_are_there(installed):
    user = installed.must("getent", "passwd", "vorn-httpd").strip().split(":")
    assert user[5:] == ["/var/lib/vorn-httpd", "/usr/sbin/nologin"] and 0 < int(user[2]) < 1000
    assert 0 < int(installed.must("getent", "group", "administrators").split(":")[2]) < 1000


def test_winbind_is_asked_for_accounts(installed):
    text = installed.path("/etc/nsswitch.conf").read_text(encoding="utf-8")
    for line in ("passwd", "group"):
        assert "winbind" in re.search(rf"^{line}:(.*)$", text, re.MULTILINE)[1].split()


def test_the_page_comes_through_the_sandbox(installed):
    answer = installed.curl("--fail", "https://127.0.0.1:8443/")
    assert answer.code == 0, (answer, installed.journal())
    assert answer.text == installed.path("/usr/vorn/share/console/index.html").read_text(encoding="utf-8")
    script = re.search(r'src="\./(assets/[^"]+\.js)"', answer.text)[1]
    assert installed.curl("--fail", f"https://127.0.0.1:8443/{script}").code == 0


def test_the_door_runs_without_privileges(installed):
    pid = installed.unit("vorn-httpd.service", "MainPID")["MainPID"]
    status = installed.path(f"/proc/{pid}/status").read_text(encoding="utf-8")
    assert re.search(r"^CapEff:\s+0+$", status, re.MULTILINE) and re.search(r"^NoNewPrivs:\s+1$", status, re.MULTILINE)
    uid = installed.must("id", "-u", "vorn-httpd").strip()
    assert re.search(rf"^\s+{uid}:", installed.must("stat", "-c", " %u:%g %a", "/var/lib/vorn-httpd"), re.MULTILINE)


def log_in(machine, user, password):
    body = json.dumps({"user": user, "password": password})
    answer = machine.curl("--header", "Content-Type: application/json", "--data", body, "--write-out", "\n%{http_code}",
                          "https://127.0.0.1:8443/session/login")
    text, _, status = answer.text.rpartition("\n")
    return status, text


def test_an_administrator_logs_in_by_pam(installed):
    installed.must("useradd", "--no-create-home", "--groups", "administrators", "alice")
    installed.must("useradd", "--no-create-home", "bob")
    installed.must("chpasswd", "--crypt-method", "SHA512", input="alice:S3cret.alice\nbob:S3cret.bob\n")
    assert log_in(installed, "alice", "S3cret.alice")[0] == "200", installed.journal()
    assert log_in(installed, "alice", "wrong")[0] == "401"
    assert log_in(installed, "bob", "S3cret.bob")[0] == "401"


def has_come_back(machine, unit, before):
    return is_active(machine, unit) == "active" and machine.unit(unit, "MainPID")["MainPID"] not in ("0", before)


@pytest.mark.parametrize("unit", ["vornd.service", "vorn-httpd.service"])
def test_a_service_that_dies_comes_back(installed, unit):
    before = installed.unit(unit, "MainPID")["MainPID"]
    installed.must("kill", "-KILL", before)
    until(lambda: has_come_back(installed, unit, before), 30, f"{unit} comes back")


@pytest.mark.parametrize("unit", ["vornd.service", "vorn-httpd.service"])
def test_a_service_that_hangs_is_started_anew(installed, unit):
    folder = f"/run/systemd/system/{unit}.d"
    installed.must("mkdir", folder)
    installed.path(f"{folder}/quick.conf").write_text("[Service]\nWatchdogSec=4\n", encoding="ascii")
    try:
        installed.must("systemctl", "daemon-reload")
        installed.must("systemctl", "restart", unit)
        before = installed.unit(unit, "MainPID")["MainPID"]
        # It tells systemd that it is well: twice the time passes, and it is the same process.
        time.sleep(8)
        assert installed.unit(unit, "MainPID", "ActiveState") == {"MainPID": before, "ActiveState": "active"}
        installed.must("kill", "-STOP", before)
        # Stopped, it can't end by itself.
        until(lambda: has_come_back(installed, unit, before), 30, f"{unit} comes back")
    finally:
        installed.must("rm", "-r", folder)
        installed.must("systemctl", "daemon-reload")
        installed.must("systemctl", "restart", unit)


def cursor(machine):
    """Where the journal ends at this moment."""
    return re.search(r"^-- cursor: (.+)$", machine.must("journalctl", "--lines", "0", "--show-cursor"), re.MULTILINE)[1]


def journal_since(machine, place, *words):
    machine.must("journalctl", "--sync")  # else what a program told before it ended may not be there yet
    return machine.must("journalctl", "--no-pager", "--output", "short", "--after-cursor", place, *words)


def test_an_option_reloads_the_file_server_through_the_sandbox(installed):
    place = cursor(installed)
    smbd = installed.unit("smbd.service", "MainPID")["MainPID"]
    installed.must("vornctl", "options", "--server-signing", "on")
    until(lambda: "Reloaded smbd.service" in journal_since(installed, place, "--unit", "smbd.service"), 20,
          "smbd is reloaded")
    assert "server signing = if_required" in installed.must("testparm", "-s", "/usr/vorn/etc/smb.conf")
    assert is_active(installed, "smbd.service") == "active"
    assert installed.unit("smbd.service", "MainPID")["MainPID"] == smbd
    errors = journal_since(installed, place, "--unit", "vornd.service", "--priority", "err")
    assert "vorn" not in errors, errors


# Stands in for one of Samba's programs: what runs it, and how the programs end there. Looks beside the join, which has no
# time for all of them.
LOOK = """#!/bin/sh
if [ -z "$LOOKS" ]; then
    LOOKS=1 setsid --fork "$0" "$@" >>/run/vorn/looked 2>&1 </dev/null
    exit 1
fi
grep -E '^(Seccomp|NoNewPrivs):' /proc/self/status
for program in "/usr/bin/nmblookup.real $*" "/usr/bin/net --version" "/usr/bin/wbinfo --version" \\
    "/usr/bin/rpcclient --version" "/usr/sbin/smbd --version"; do
    $program >/dev/null 2>&1
    echo "${program%% *} $?"
done
"""


def test_a_join_runs_sambas_programs_inside_the_sandbox(installed):
    place = cursor(installed)
    looked = installed.path("/run/vorn/looked")
    installed.must("mv", "/usr/bin/nmblookup", "/usr/bin/nmblookup.real")
    try:
        installed.path("/usr/bin/nmblookup").write_text(LOOK, encoding="ascii")
        installed.must("chmod", "755", "/usr/bin/nmblookup")
        result = installed.run("vornctl", "--json", "join", "nowhere.test", "--user", "Administrator",
                               "--password-stdin", input="Secret.77\n", deadline=120)
        until(lambda: looked.exists() and "smbd" in looked.read_text(encoding="ascii"), 30, "the look ends")
    finally:
        installed.must("mv", "-T", "/usr/bin/nmblookup.real", "/usr/bin/nmblookup")
    told = journal_since(installed, place, "--unit", "vornd.service")
    assert result.code == 1 and json.loads(result.text)["error"]["code"] == 2605, (result, told)
    assert "discover: failed" in told, told
    # Nobody answers here, so the first one ends with 1; none is refused or killed.
    assert looked.read_text(encoding="ascii").splitlines() == [
        "NoNewPrivs:\t1", "Seccomp:\t2", "/usr/bin/nmblookup.real 1", "/usr/bin/net 0", "/usr/bin/wbinfo 0",
        "/usr/bin/rpcclient 0", "/usr/sbin/smbd 0"], told


def test_who_is_no_member_leaves_without_a_complaint(installed):
    place = cursor(installed)
    result = installed.run("vornctl", "leave", "--yes")
    assert result.code == 0, result
    errors = journal_since(installed, place, "--unit", "vornd.service", "--priority", "warning")
    assert "vorn" not in errors, errors


def test_vornd_ends_in_order_after_calls(installed):
    # Each goes into a module, and with that into the libraries that are unloaded at the end.
    for words in (["status"], ["options"], ["schedule"], ["list"], ["events"]):
        installed.run("vornctl", *words)
    place = cursor(installed)
    installed.must("systemctl", "stop", "vornd.service")
    shown = installed.unit("vornd.service", "ActiveState", "Result", "ExecMainCode", "ExecMainStatus")
    assert shown == {"ActiveState": "inactive", "Result": "success", "ExecMainCode": "1", "ExecMainStatus": "0"}
    told = journal_since(installed, place, "--unit", "vornd.service")
    assert re.search(r"vornd\[\d+\]: ended$", told, re.MULTILINE) and "signal" not in told.replace(
        "ending on signal 15", ""), told
    installed.must("systemctl", "start", "vornd.service")
    installed.must("vornctl", "status")


def test_the_page_is_served_anew_when_its_package_goes_and_comes(installed, packages):
    installed.must("dpkg", "--remove", "vorn-console")
    until(lambda: "404" in installed.curl("--output", "/dev/null", "--write-out", "%{http_code}",
                                          "https://127.0.0.1:8443/").text, 30, "the page is gone")
    installed.install(packages["vorn-console"])
    until(lambda: installed.curl("--fail", "https://127.0.0.1:8443/").code == 0, 30, "the page is back")
    assert "/usr/vorn/sbin/vornd" in processes_of(installed, "/usr/vorn/")
