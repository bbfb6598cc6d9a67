"""Command lines that are wrong, a configuration that can't be used, a second server: one clear line each, and nothing
changed."""

import pytest

from appliance import Appliance
from client import CONF, DIRECTORY, DOMAIN, SCHEDULE
from obstacles import Log, away, files_under, replaced

SMB_CONF = "/usr/vorn/etc/smb.conf"
VORND = "/usr/vorn/sbin/vornd"
NOBODY = ("setpriv", "--reuid=65534", "--clear-groups", "--")


@pytest.fixture(scope="module")
def machine(lab):
    """One appliance for all tests of this file; each leaves it as it found it, vornd running."""
    machine = Appliance(lab, "nas1")
    machine.renew()
    return machine


@pytest.fixture
def unchanged(machine):
    before = files_under(machine, "/usr/vorn/etc", "/var/lib/vorn")
    yield
    assert files_under(machine, "/usr/vorn/etc", "/var/lib/vorn") == before
    assert machine.client.get() == {"enable_domain": False}


# Program and arguments, exit code, what the message says.
WRONG_COMMANDS = [
    (VORND, ["--nope"], 2, '"--nope" is unknown'),
    (VORND, ["--socket"], 2, '"--socket" needs a value'),
    (VORND, ["--socket="], 2, '"--socket=" needs a value'),
    (VORND, ["--foreground=yes"], 2, "--foreground"),
    (VORND, ["more"], 2, '"more" is one argument too many'),
    (VORND, ["--socket", "/tmp/" + "x" * 200], 1, "more than 107 bytes"),
    (VORND, ["--socket", "/nowhere/vornd.sock"], 1, "/nowhere/vornd.sock"),
    (VORND, ["--socket", "/etc/passwd"], 1, "/etc/passwd: something else has this name"),
    (VORND, ["--socket", "/tmp/other.sock", "--module", "/nowhere.so"], 1, "/nowhere.so refused: No such file"),
    ("vornwin", [], 2, "vornwin --help"),
    ("vornwin", ["-nope"], 2, "vornwin --help"),
    ("vornwin", ["-updateDomain", "more"], 2, "vornwin --help"),
    ("vornwin", ["-makeHome"], 2, "vornwin --help"),
    ("vornwin", ["-makeHome", "--"], 2, "vornwin --help"),
    ("vornjoin", ["--nope"], 2, "--help"),
    ("vornjoin", ["--recover", "more"], 2, "--help"),
    ("vornctl", [], 2, "command is missing"),
    ("vornctl", ["nope"], 2, 'no command "nope"'),
    ("vornctl", ["no\npe"], 2, 'no command "no\\x0Ape"'),
    ("vornctl", ["--nope", "status"], 2, "no option --nope"),
    ("vornctl", ["status", "--nope=secret"], 2, "no option --nope;"),
    ("vornctl", ["status", "more"], 2, "too many arguments"),
    ("vornctl", ["--json"], 2, "command is missing"),
    ("vornctl", ["join"], 2, "DOMAIN is required"),
    ("vornctl", ["join", "lab.test"], 2, "--user is required"),
    ("vornctl", ["join", "lab.test", "--user"], 2, "--user needs a value"),
    ("vornctl", ["join", "lab.test", "--user", "a", "--password", "secret"], 2, "A password is no option"),
    ("vornctl", ["join", "lab.test", "other.test", "--user", "a"], 2, "too many arguments"),
    ("vornctl", ["leave"], 2, "use --yes"),
    ("vornctl", ["status", "--timeout", "0"], 2, "--timeout"),
    ("vornctl", ["status", "--timeout", "soon"], 2, "--timeout"),
    ("vornctl", ["users", "--limit", "0"], 2, "--limit"),
    ("vornctl", ["options", "--nested-groups", "100"], 2, "--nested-groups"),
    ("vornctl", ["schedule", "--weekly", "0", "--at", "99:00"], 2, '"99:00" is no time'),
    ("vornctl", ["call", DOMAIN], 2, "VERSION is required"),
    ("vornctl", ["call", DOMAIN, "1", "get", "{"], 2, "no JSON object"),
    ("vornctl", ["call", DOMAIN, "1", "get", "[]"], 2, "no JSON object"),
    ("vornctl", ["explain", "nope"], 2, "CODE"),
    ("vornctl", ["explain", "9999"], 1, "no error code 9999"),
    ("vornctl", ["--socket", "/nowhere", "status"], 3, "/nowhere"),
    ("vornctl", ["--socket", "/etc/passwd", "status"], 3, "/etc/passwd"),
]


def test_wrong_command_lines(machine, unchanged):
    for program, words, code, text in WRONG_COMMANDS:
        result = machine.exec(program, *words, deadline=20)
        assert result.code == code, result
        assert result.out == "", result
        assert text in result.err, result
        assert result.err.startswith(program.rsplit("/", maxsplit=1)[-1] + ": "), result
        assert "secret" not in result.err, result
        assert result.err.endswith("\n") and result.err.count("\n") == 1, result
    assert not machine.exists("/tmp/other.sock")


def test_a_call_of_what_is_not_there_is_explained(machine, unchanged):
    result = machine.ctl("call", "No.Such.Api", "1", "get")
    assert (result.code, result.out) == (1, ""), result
    lines = result.err.splitlines()
    assert lines[0] == "vornctl: There is no such API." and "  Code:    210" in lines, result


def test_the_join_tool_takes_no_other_request(machine, unchanged):
    for request in ["", "junk", "junk\n", "{}\n", "[]\n", '{"action": "stay"}\n', '{"action": "join", "domain": 5}\n',
                    '{"action": "join", "action": "leave"}\n', '{"action": "join"} {}\n', '{"action": "join"}\na\0b',
                    "[" * 60000 + "\n", "x" * 70000]:
        result = machine.exec("vornjoin", input=request, deadline=20)
        assert result.code == 2, (request[:50], result)
        assert result.err.startswith("vornjoin: bad request: ") and result.err.count("\n") == 1, result
        assert result.out == ""


def test_what_vornwin_can_not_do_stands_in_the_log(machine, unchanged):
    for words, text in [(["-updateDomain"], "no member of a domain"),
                        (["-makeHome", "--", "../../tmp/x"], "no home folder"),
                        (["-makeHome", "--", "-x\n"], "no home folder")]:
        log = Log(machine)
        assert machine.exec("vornwin", *words).code == 1
        machine.wait_until(lambda: log.says("vornwin", text), 5, text)
    assert not machine.exists("/tmp/domain_user.pid")


def test_only_root_may(machine, unchanged):
    for program, code in [(VORND, 1), ("/usr/vorn/sbin/vornwin", 1), ("/usr/vorn/sbin/vornjoin", 2)]:
        words = ["-updateDomain"] if program.endswith("vornwin") else []
        result = machine.exec(*NOBODY, program, *words)
        assert (result.code, result.err.count("\n")) == (code, 1), result
        assert "only root" in result.err
    result = machine.exec(*NOBODY, "/usr/vorn/bin/vornctl", "status")
    assert result.code == 1 and "You may not use the appliance's API." in result.err, result


def test_a_second_server_leaves_the_first_one_alone(machine, unchanged):
    socket = machine.path("/run/vorn/vornd.sock").stat().st_ino
    for words in [[], ["--socket", "/run/vorn/vornd.sock"], ["--foreground"]]:
        result = machine.exec(VORND, *words, deadline=10)
        assert result.code == 1
        assert result.err.endswith("vornd: another vornd serves /run/vorn/vornd.sock\n"), result
    assert machine.path("/run/vorn/vornd.sock").stat().st_ino == socket
    machine.stop()
    machine.start()


# How the file is damaged, and the code of "get"; none when the file still says that this is no member.
UNREADABLE = {
    "a folder": ('rm "$1"; mkdir "$1"', 2622),
    "a loop": ('ln -sf smb.conf "$1"', 2622),
    "a pipe": ('rm "$1"; mkfifo "$1"', 2622),
    "100 MB": ('truncate -s 100M "$1"', 2622),
    "empty": (': >"$1"', 2622),
    "junk": ('head -c 5000 /dev/urandom | tr "[w" "xx" >"$1"', 2622),
    "NULs": ('head -c 5000 /dev/zero >"$1"', 2622),
}
BROKEN = {
    "an unclosed section": 'sed -i "s/^.global.$/[global/" "$1"',
    "a missing include": 'printf "include = /nowhere/more.conf\\n" >>"$1"',
    "10 MB": 'head -c 10000000 /dev/zero | tr "\\0" "#" >>"$1"',
    "a line without end": 'printf "comment = a \\\\\\\\" >>"$1"',
    "no end of the last line": 'printf "comment = a" >>"$1"',
    "an unknown key": 'printf "no such key = 1\\n" >>"$1"',
}


@pytest.mark.parametrize("damage, code", UNREADABLE.values(), ids=UNREADABLE)
def test_a_configuration_that_can_not_be_used(machine, unchanged, damage, code):
    client = machine.client
    with replaced(machine, SMB_CONF, damage):
        damaged = machine.read(SMB_CONF) if machine.path(SMB_CONF).is_file() else None
        log = Log(machine)
        for api, method, parameters, expected in [
            (DOMAIN, "get", {}, code),
            (DOMAIN, "test_dc", {}, code),
            (DOMAIN, "get_domain_list", {}, code),
            (DOMAIN, "set", {"enable_domain": False}, code),
            (DOMAIN, "set", {"enable_domain": True, "domain_name": "lab.test", "username": "a", "password": "b"}, code),
            (DIRECTORY, "users", {}, 2617),
            (DIRECTORY, "leave", {"delete_account": False}, 2617),
            (SCHEDULE, "set", {"date_type": 0, "week_name": "1", "hour": 1, "min": 1}, 2624),
        ]:
            answer = client.call(api, 1, method, parameters)
            assert (answer.code, answer.status) == (expected, 200), (method, answer.body)
            assert answer.seconds < 3
        assert client.call(SCHEDULE, 1, "get").data == {"date_type": 2}
        result = machine.ctl("status")
        assert result.code == 1 and SMB_CONF in result.err, result
        machine.wait_until(lambda: log.says("vornd", SMB_CONF), 5, f"the log does not name {SMB_CONF}")
        if damaged is not None:
            assert machine.read(SMB_CONF) == damaged


@pytest.mark.parametrize("kind", ["a folder", "a loop", "a pipe", "100 MB"])
def test_no_start_with_an_unreadable_configuration(machine, unchanged, kind):
    machine.stop()
    try:
        with replaced(machine, SMB_CONF, UNREADABLE[kind][0]):
            result = machine.exec(VORND, deadline=10)
            assert result.code == 1
            assert result.err.startswith(f"vornd: {SMB_CONF} can't be ") and result.err.count("\n") == 1, result
    finally:
        machine.start()


@pytest.mark.parametrize("damage", BROKEN.values(), ids=BROKEN)
def test_a_configuration_with_a_flaw_is_served_and_kept(machine, damage):
    client = machine.client
    with replaced(machine, SMB_CONF, damage):
        flawed = machine.read(SMB_CONF)
        assert client.get() == {"enable_domain": False}
        assert client.domains() == []
        assert client.leave().ok
        assert machine.read(SMB_CONF) == flawed
        for value in (True, False):
            assert client.call(CONF, 1, "set", {"enable_sync_time": value}).ok
            assert client.options()["enable_sync_time"] is value
            lines = machine.read(SMB_CONF).splitlines()
            assert [line for line in lines if b"vorn sync dctime" not in line] == flawed.splitlines()
            assert len(lines) == len(flawed.splitlines()) + 1
    assert client.get() == {"enable_domain": False}


def test_the_log_names_the_file_and_the_reason(machine, unchanged):
    for damage, reason in [('rm "$1"; mkdir "$1"', "Is a directory"), ('rm "$1"', "No such file or directory")]:
        with replaced(machine, SMB_CONF, damage):
            log = Log(machine)
            assert machine.client.call(DOMAIN, 1, "get").code == 2622
            machine.wait_until(lambda: log.says("vornd", SMB_CONF, reason), 2, f"the log holds {log.lines}")


def test_settings_that_can_not_be_read(machine, unchanged):
    settings = "/etc/vorninfo.conf"
    with replaced(machine, settings, 'rm "$1"; mkdir "$1"'):
        log = Log(machine)
        answer = machine.client.join("lab.test", "Administrator", "x", manage_mode=1)
        assert answer.code == 2617, answer.body
        machine.wait_until(lambda: log.says(settings, "Is a directory"), 5, f"the log does not name {settings}")
        machine.stop()
        try:
            result = machine.exec(VORND, deadline=10)
            assert (result.code, result.err) == (1, f"vornd: {settings} can't be read: Is a directory\n"), result
        finally:
            machine.must("rmdir", settings)
            machine.must("cp", "-a", settings + ".kept", settings)
            machine.start()


def test_a_missing_configuration_begins_with_the_default(machine):
    machine.stop()
    first = machine.read(SMB_CONF)
    with away(machine, SMB_CONF):
        log = Log(machine)
        machine.start()
        assert machine.read(SMB_CONF) == machine.read("/usr/vorn/share/defaults/smb.conf")
        machine.wait_until(lambda: log.says(SMB_CONF, "made from the defaults"), 5, "no line in the log")
        machine.stop()
        machine.must("rm", SMB_CONF)
        with away(machine, "/usr/vorn/share/defaults/smb.conf"):
            result = machine.exec(VORND, deadline=10)
            assert result.code == 1 and result.err.count("\n") == 1, result
            assert SMB_CONF in result.err and "No such file" in result.err
    machine.start()
    assert machine.read(SMB_CONF) == first
