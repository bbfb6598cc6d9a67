"""vornd is told to end while a join runs: the join is answered, nobody new is let in, the membership is whole."""

import concurrent.futures
import signal
import socket

import pytest

from joins import ends_well, under_way
from lab import password
from processes import programs, tasks

VORND = "/usr/vorn/sbin/vornd"
SOCKET = "/run/vorn/vornd.sock"


def answered(machine):
    try:
        return machine.client.get() is not None
    except OSError:
        return False


def connect(machine):
    connection = socket.socket(socket.AF_UNIX)
    connection.settimeout(10)
    connection.connect(str(machine.path(SOCKET)))
    return connection


def received(connection):
    """All that comes until the other side closes."""
    text = b""
    while piece := connection.recv(65536):
        text += piece
    return text


def test_a_join_is_answered_by_a_server_that_is_told_to_end(appliance):
    machine = appliance
    machine.stop()
    with concurrent.futures.ThreadPoolExecutor(2) as threads:
        # Not as the lab starts it: how it ends is to be seen.
        server = threads.submit(machine.exec, VORND, deadline=150)
        machine.wait_until(lambda: answered(machine), 20, "vornd's start")
        join = threads.submit(machine.client.join, "lab.test", "Administrator", password("LAB", "Administrator"))
        with under_way(machine), connect(machine) as idle, connect(machine) as half:
            half.sendall(b"POST /webapi/VORN.Core.Directory.Domain/1/get HTTP/1.1\r\nHost: x\r\n")
            # Answered, so that the other two are known to the server by now.
            assert answered(machine)
            for process in programs(machine, "vornd"):
                process.signal(signal.SIGTERM)
            assert received(idle) == b""
            refusal = received(half)
            assert refusal.startswith(b"HTTP/1.1 503 ") and b'"code":241' in refusal, refusal
            assert not machine.exists(SOCKET)
            with pytest.raises(OSError):
                connect(machine)
            assert not join.done() and not server.done() and programs(machine, "vornd")
        answer = join.result(90)
        assert answer.ok, (answer.body, machine.syslog())
        ended = server.result(20)
        assert ended.code == 0, ended
    assert not programs(machine, "vornd") and not tasks(machine)
    assert "ending on signal 15; 1 calls run" in machine.syslog()
    machine.start()
    ends_well(machine)
    assert machine.client.test_dc() is True
