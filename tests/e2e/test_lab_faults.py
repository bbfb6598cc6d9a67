"""The lab's faults: who can't reach what any more, who still can, and that all is well again afterwards."""

import datetime
import time

import pytest

from lab import DeadlinePassed, password

PORTS = (53, 88, 135, 139, 389, 445)


def knock(lab, host, controller, port, patience=5):
    """Connects by TCP: "open", "refused", "unreachable" or "silent", and the seconds that it took: of "open" those of
    the connection alone, without the start of the programs."""
    begin = time.monotonic()
    script = 'begin=$EPOCHREALTIME; exec 3<>"/dev/tcp/$1/$2" && echo "$begin $EPOCHREALTIME"'
    result = lab.exec(host, "timeout", str(patience), "bash", "-c", script, "knock", lab.address(controller), str(port))
    seconds = time.monotonic() - begin
    if result.code == 0:
        asked, open_at = map(float, result.out.split())
        return "open", open_at - asked
    if result.code == 124:
        return "silent", seconds
    return "refused" if "refused" in result.err else "unreachable", seconds


def states(lab, host, controller="dc1", silent=()):
    """Of all ports; those that should be SILENT are not waited for that long."""
    return {port: knock(lab, host, controller, port, 1 if port in silent else 5)[0] for port in PORTS}


@pytest.mark.parametrize("fault, closed, state", [
    ("smb-drop", (139, 445), "silent"),
    ("smb-rst", (139, 445), "refused"),
    ("445-drop", (445,), "silent"),
    ("ldap-drop", (389,), "silent"),
    ("kdc-drop", (88,), "silent"),
    ("dns-drop", (53,), "silent"),
    ("rpc-drop", (135,), "silent"),
    ("dead", PORTS, "silent"),
])
def test_packets_vanish_or_are_refused(lab, fault, closed, state):
    healthy = {port: "open" for port in PORTS}
    assert states(lab, "nas1") == healthy
    with lab.fault(fault):
        silent = closed if state == "silent" else ()
        assert states(lab, "nas1", silent=silent) == {**healthy, **{port: state for port in closed}}
        assert states(lab, "nas1", "dc2") == healthy
        assert fault in lab.must("status").out
    assert states(lab, "nas1") == healthy
    assert fault not in lab.must("status").out


def test_a_fault_for_one_host_leaves_the_others_alone(lab):
    with lab.fault("smb-rst", only="nas1"):
        assert knock(lab, "nas1", "dc1", 445)[0] == "refused"
        assert knock(lab, "nas2", "dc1", 445)[0] == "open"
        assert knock(lab, "dc2", "dc1", 445)[0] == "open"


def test_faults_add_up(lab):
    with lab.fault("smb-drop"):
        lab.must("fault", "kdc-drop")
        found = [knock(lab, "nas1", "dc1", port, patience)[0] for port, patience in ((88, 1), (389, 5), (445, 1))]
        assert found == ["silent", "open", "silent"]


def test_udp_vanishes_too(lab):
    question = ("dig", f"@{lab.address('dc1')}", "+short", "+tries=1", "dc1.lab.test")
    assert lab.exec("nas1", *question, "+time=5").out == "10.77.0.10\n"
    with lab.fault("dns-drop"):
        assert "no servers could be reached" in lab.exec("nas1", *question, "+time=1").text
    lookup = ("nmblookup", "-U", lab.address("pdc"), "NT4DOM#1B")
    assert "10.77.0.40 NT4DOM<1b>" in lab.exec("nas1", *lookup).out
    with lab.fault("netbios-drop", "pdc"):
        assert "failed to find name" in lab.exec("nas1", *lookup).text


def test_a_pulled_cable_cuts_off_and_can_be_plugged_in_again(lab):
    with lab.fault("unplugged"):
        # Silent at first, unreachable when the neighbour is forgotten.
        assert knock(lab, "nas1", "dc1", 445, 1)[0] in ("silent", "unreachable")
        assert " state DOWN " in lab.exec("dc1", "ip", "link", "show", "eth0").out.replace("LOWERLAYERDOWN", "DOWN")
    assert knock(lab, "nas1", "dc1", 445, 5)[0] == "open"


@pytest.mark.parametrize("only", [None, "nas1"])
def test_slow_packets(lab, only):
    with lab.fault("slow", only=only):
        knock(lab, "nas1", "dc1", 445, 5)  # the address is asked for on the way
        assert 0.3 <= knock(lab, "nas1", "dc1", 445, 5)[1] < 2
        elsewhere = knock(lab, "nas2", "dc1", 445, 5)
        assert elsewhere[0] == "open" and (elsewhere[1] < 0.2 if only else elsewhere[1] >= 0.3)
        # Much data goes through unharmed.
        result = lab.exec("nas1", "net", "rpc", "user", "-S", lab.address("dc1"), "-U", "LAB/alice",
                          env={"PASSWD": password("LAB", "alice")})
        assert result.code == 0 and "jörg" in result.out, result
    assert knock(lab, "nas1", "dc1", 445)[1] < 0.2


def test_a_frozen_controller_takes_connections_and_says_nothing(lab):
    ticket = ("sh", "-c", "KRB5CCNAME=MEMORY: kinit alice@LAB.TEST")
    secret = password("LAB", "alice") + "\n"
    with lab.frozen("dc1"):
        assert knock(lab, "nas1", "dc1", 445)[0] == "open"
        with pytest.raises(DeadlinePassed):
            lab.exec("nas1", *ticket, input=secret, deadline=2)
        assert "frozen" in lab.must("status").out
    assert lab.exec("nas1", *ticket, input=secret, deadline=20).code == 0


@pytest.mark.parametrize("controller", ["dc1", "pdc"])
def test_a_killed_controller_refuses_and_can_be_started_again(lab, controller):
    with lab.killed(controller):
        assert knock(lab, "nas1", controller, 445)[0] == "refused"
        assert "stopped" in lab.must("status").out
    assert knock(lab, "nas1", controller, 445)[0] == "open"


def test_a_controller_whose_clock_differs(lab):
    def difference():
        told = lab.exec("nas1", "net", "time", "system", "-S", lab.address("dc1"))
        here = lab.exec("nas1", "date", "+%m%d%H%M%Y.%S")
        assert told.code == here.code == 0, told
        return [datetime.datetime.strptime(result.out.strip(), "%m%d%H%M%Y.%S") for result in (told, here)]

    lab.must("kill-dc", "dc1")
    try:
        lab.must("start-dc", "dc1", "--clock", "600", deadline=90)
        told, here = difference()
        assert 595 < (told - here).total_seconds() < 605
    finally:
        lab.must("kill-dc", "dc1")
        lab.must("start-dc", "dc1", deadline=90)
    told, here = difference()
    assert abs((told - here).total_seconds()) < 5


@pytest.mark.parametrize("words", [
    ("fault",), ("fault", "nonsense"), ("fault", "dead", "nas1"), ("fault", "dead", "dc1", "--from"),
    ("fault", "dead", "dc1", "dc2"), ("freeze", "nas1"), ("kill-dc",), ("vornd", "nas1", "jump"), ("vornd", "nas1"),
    ("exec", "nas1"), ("nonsense",), (), ("dns", "nas1"), ("dns", "nas1", "-x"), ("down", "now"),
    ("start-dc", "dc1", "--clock"), ("start-dc", "pdc", "--clock", "1"), ("start-dc", "dc1", "--clock", "soon"),
    ("vornd", "dc1", "stop"), ("httpd", "nas1"), ("httpd", "nas1", "jump"), ("httpd", "dc1", "start"),
    ("httpd", "nas1", "stop", "now"), ("httpd", "nas1", "start", "--listen"), ("httpd", "nas1", "start", "now"),
    ("httpd", "nas1", "start", "--listen", "localhost:1"),
])
def test_wrong_usage_is_told_in_one_line(lab, words):
    result = lab.command(*words)
    assert result.code == 2 and result.out == "" and len(result.err.splitlines()) == 1, result
    assert result.err.startswith("lab: "), result


@pytest.mark.parametrize("words", [
    ("exec", "nas9", "true"), ("exec", "../../etc", "true"), ("fault", "dead", "--from", "x"),
])
def test_unknown_hosts_are_told_in_one_line(lab, words):
    result = lab.command(*words)
    assert result.code == 1 and len(result.err.splitlines()) == 1 and "there is no host" in result.err, result
