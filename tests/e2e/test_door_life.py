"""A join by way of the door, while sessions end, the door ends and comes back. The join itself is never harmed."""

import contextlib
import http.client
import socket
import ssl
import threading
import time

from client import DIRECTORY, DOMAIN
from joins import ends_well, steps, under_way
from lab import password
from processes import programs
from raw_door import fields


class Join(threading.Thread):
    """A join from a browser, on a thread of its own: ANSWER, or what went wrong with the connection."""

    def __init__(self, visitor):
        super().__init__(daemon=True)
        self.visitor = visitor
        self.answer = None
        self.error = None
        self.start()

    def run(self):
        try:
            self.answer = self.visitor.call(DOMAIN, 1, "set", {
                "enable_domain": True, "domain_name": "lab.test", "username": "Administrator",
                "password": password("LAB", "Administrator")}, deadline=90)
        except (OSError, http.client.HTTPException) as error:
            self.error = error

    def result(self):
        self.join(90)
        assert not self.is_alive()
        return self.answer


def leave(machine):
    assert machine.client.leave().ok


def test_sessions_and_doors_end_while_a_join_runs(door, lab):
    """One appliance joins four times, so that the machine is set up once."""
    machine = door.appliance

    # Log-out: the answer is withheld, the join is not.
    visitor, other = door.login(), door.login()
    join = Join(visitor)
    with under_way(machine):
        leaving = door.visitor()
        leaving.cookie, leaving.csrf = visitor.cookie, visitor.csrf
        assert leaving.logout().status == 200
        assert steps(machine)["finished"] is None, "the join was over before the log-out"
    answer = join.result()
    assert (answer.status, answer.code) == (401, 220) and "data" not in answer.body
    ends_well(machine)
    assert other.call(DOMAIN, 1, "get").data["domain_name"] == "LAB"
    leave(machine)

    # SIGTERM: whoever waits is answered, and nobody new is let in.
    join = Join(other)
    with under_way(machine):
        with door.connect() as idle:
            idle.settimeout(10)
            stopper = threading.Thread(target=door.stop, daemon=True)
            stopper.start()
            assert idle.recv(1) == b""
        machine.wait_until(lambda: not reachable(door), 5, "the end of listening")
        assert steps(machine)["finished"] is None and programs(machine, "vorn-httpd")
    answer = join.result()
    assert answer is not None and answer.ok, (answer, join.error)
    stopper.join(30)
    assert not programs(machine, "vorn-httpd")
    ends_well(machine)
    leave(machine)

    # SIGKILL: the browser loses its connection, the join goes on, and the session is still good.
    door.start()
    join = Join(other)
    with under_way(machine):
        door.kill()
        assert join.result() is None and join.error is not None
        assert steps(machine)["finished"] is None
        door.start()
        assert other.call(DIRECTORY, 1, "overview", background=True).data["busy"] == "join"
    ends_well(machine)
    leave(machine)

    # The browser goes away.
    body = (b'{"enable_domain":true,"domain_name":"lab.test","username":"Administrator","password":"'
            + password("LAB", "Administrator").encode() + b'"}')
    lines = [f"POST /webapi/{DOMAIN}/1/set HTTP/1.1", *fields(door, other), "Content-Type: application/json",
             f"Content-Length: {len(body)}"]
    with contextlib.ExitStack() as still:
        with door.connect() as connection:
            connection.sendall("\r\n".join(lines).encode() + b"\r\n\r\n" + body)
            still.enter_context(under_way(machine))
        assert steps(machine)["finished"] is None
    ends_well(machine)
    assert other.session().status == 200


def reachable(door):
    with contextlib.suppress(OSError, ssl.SSLError), socket.create_connection((door.address, door.port), timeout=1):
        return True
    return False


def test_an_idle_door_ends_at_once(door):
    visitor = door.login()
    kept = [door.connect() for _ in range(20)]
    begin = time.monotonic()
    door.stop()
    assert time.monotonic() - begin < 4
    for connection in kept:
        connection.settimeout(5)
        with contextlib.suppress(ConnectionError):
            assert connection.recv(1) == b""
        connection.close()
    assert "ending on signal" in door.appliance.syslog()
    door.start()
    assert visitor.session().status == 200


def test_a_request_that_is_half_there_does_not_keep_the_door(door):
    with door.connect() as connection:
        # It comes along with a whole one, whose answer tells that it is there.
        connection.sendall(b"GET /nothing HTTP/1.1\r\nHost: x\r\n\r\nGET / HTTP/1.1\r\nHost: x\r\n")
        assert connection.recv(65536).startswith(b"HTTP/1.1 404 ")
        begin = time.monotonic()
        door.stop()
        assert time.monotonic() - begin < 5
        assert connection.recv(4096).startswith(b"HTTP/1.1 503 ")
    door.start()
