"""Clients that take their time: they are cut off when the time is over, and keep nobody else waiting."""

import concurrent.futures
import contextlib
import itertools
import socket
import ssl
import threading
import time

import pytest

from client import DOMAIN
from door import COOKIE, Door
from raw_door import fields, parts, post

LARGE = 24 * 2**20
LATE = 4  # seconds that a busy machine may add


@pytest.fixture(scope="module")
def door(shared_door):
    """With a page of one small and one large file."""
    machine = shared_door.appliance
    shared_door.stop()
    machine.must("sh", "-c", f"mkdir -p /tmp/page && echo page >/tmp/page/index.html && "
                             f"head -c {LARGE} /dev/urandom >/tmp/page/large.bin && chmod -R a+rX /tmp/page")
    entrance = Door(machine)
    entrance.start("--page", "/tmp/page")
    yield entrance
    entrance.stop()
    shared_door.start()


@pytest.fixture(scope="module")
def visitor(door):
    return door.login()


def is_open(connection):
    """Nothing has come, neither an answer nor the end."""
    connection.settimeout(0)
    try:
        connection.recv(1)
        return False
    except (BlockingIOError, ssl.SSLWantReadError):
        return True
    except OSError:
        return False


def until_end(connection, seconds, drip=None, every=0.5):
    """Waits for the other side to close while DRIP is sent byte by byte: (what came, how long it took)."""
    begin = time.monotonic()
    received = bytearray()
    drops = itertools.cycle(drip or b"")
    while time.monotonic() - begin < seconds:
        connection.settimeout(every)
        try:
            if drip and not received:
                connection.send(bytes([next(drops)]))
            piece = connection.recv(65536)
            if not piece:
                break
            received += piece
        except TimeoutError:
            continue
        except (ConnectionError, ssl.SSLError):
            break
    return bytes(received), time.monotonic() - begin


def hello_of_tls():
    """The first bytes of a handshake."""
    incoming, outgoing = ssl.MemoryBIO(), ssl.MemoryBIO()
    with contextlib.suppress(ssl.SSLWantReadError):
        Door.tls_context().wrap_bio(incoming, outgoing).do_handshake()
    return outgoing.read()


def test_whoever_is_slow_is_cut_off_in_time(door, visitor):
    """All at once, so that it takes as long as the slowest of them."""
    head = post(door, visitor, "Content-Length: 500")
    chunks = post(door, visitor, "Transfer-Encoding: chunked")

    def plain(drip):
        with socket.create_connection((door.address, door.port), timeout=5) as connection:
            return until_end(connection, 30, drip)

    def secure(first, drip):
        with door.connect() as connection:
            connection.sendall(first)
            return until_end(connection, 30, drip)

    def reader():
        """Asks for a lot and takes nothing of it: how much was kept for it."""
        with socket.socket() as plain_socket:
            plain_socket.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
            plain_socket.settimeout(30)
            plain_socket.connect((door.address, door.port))
            with door.tls_context().wrap_socket(plain_socket) as connection:
                connection.sendall(b"GET /large.bin HTTP/1.1\r\nHost: x\r\n\r\n")
                time.sleep(15 + LATE)
                size = 0
                with contextlib.suppress(OSError):
                    while piece := connection.recv(65536):
                        size += len(piece)
                return size

    with concurrent.futures.ThreadPoolExecutor(20) as pool:
        silent = pool.submit(plain, None)
        handshake = pool.submit(plain, hello_of_tls())
        requests = {
            "one byte": pool.submit(secure, b"G", None),
            "header without an end": pool.submit(secure, head[:-4], None),
            "dripping first line": pool.submit(secure, b"GET /", b"a"),
            "dripping header": pool.submit(secure, b"GET / HTTP/1.1\r\n", b"X-Other: a\r\n"),
            "no body": pool.submit(secure, head, None),
            "dripping body": pool.submit(secure, head, b"a"),
            "dripping chunks": pool.submit(secure, chunks, b"1\r\na\r\n"),
            "body after a question": pool.submit(secure, post(door, visitor, "Content-Length: 5",
                                                              "Expect: 100-continue"), None),
            "a whole request, then a piece": pool.submit(
                secure, post(door, visitor, "Content-Length: 2", body=b"{}") + b"POST ", None),
        }
        taken = pool.submit(reader)
        for name, attempt in (("silent", silent), ("handshake", handshake)):
            received, seconds = attempt.result()
            assert received == b"" and 8 <= seconds <= 15 + LATE, name
        for name, attempt in requests.items():
            received, seconds = attempt.result()
            answers = [answer for answer in parts(received) if answer.status not in (100, 200)]
            assert [answer.status for answer in answers] == [408] and b"215" in answers[0].body, (name, received)
            assert answers[0].headers["Connection"] == "close", name
            assert 14 <= seconds <= 15 + LATE, (name, seconds)
        assert 0 < taken.result() < LARGE
    assert door.login().call(DOMAIN, 1, "get").ok


@contextlib.contextmanager
def crowd(door, count, first=b""):
    """So many connections, each of which has sent FIRST."""
    connections = []
    try:
        for _ in range(count):
            connections.append(door.connect())
            if first:
                connections[-1].sendall(first)
        yield connections
    finally:
        for connection in connections:
            connection.close()


def served(door, visitor):
    """How long a newcomer waits for a connection, a file of the page and a call."""
    begin = time.monotonic()
    assert door.get("/", deadline=5).status == 200
    assert visitor.call(DOMAIN, 1, "get", deadline=5).ok
    return time.monotonic() - begin


def test_a_crowd_of_idle_and_dripping_clients_keeps_nobody_waiting(door, visitor):
    ended = threading.Event()

    def drip(connections):
        while not ended.wait(0.3):
            for connection in connections:
                with contextlib.suppress(OSError):
                    connection.sendall(b"a")

    with crowd(door, 100) as idle, crowd(door, 100, b"GET / HTTP/1.1\r\nX-Slow: ") as dripping:
        dripper = threading.Thread(target=drip, args=[dripping], daemon=True)
        dripper.start()
        try:
            times = [served(door, visitor) for _ in range(25)]
        finally:
            ended.set()
            dripper.join(10)
        assert max(times) < LATE, times
        assert all(map(is_open, idle)) and all(map(is_open, dripping))


def test_the_oldest_idle_connection_makes_room(door, visitor):
    request = "\r\n".join(["GET / HTTP/1.1", *fields(door)]).encode() + b"\r\n\r\n"
    with crowd(door, 300, request) as connections:
        assert served(door, visitor) < LATE
        for connection in connections[-200:]:
            connection.settimeout(5)
            assert connection.recv(65536).startswith(b"HTTP/1.1 200 ")
            connection.sendall(request)
            assert connection.recv(65536).startswith(b"HTTP/1.1 200 ")

        def is_closed(connection):
            connection.settimeout(5)
            with contextlib.suppress(ConnectionError, ssl.SSLError):
                while connection.recv(65536):
                    pass
            return True

        assert all(map(is_closed, connections[:40]))


def test_unfinished_requests_make_room_when_nobody_is_idle(door, visitor):
    with crowd(door, 256, b"GET / HTTP/1.1\r\nX-Slow: a") as connections:
        time.sleep(1.1)  # so long a newcomer is left alone
        assert served(door, visitor) < LATE
        with crowd(door, 20):
            assert served(door, visitor) < LATE
        assert 200 < sum(map(is_open, connections)) < 256


def test_handshakes_that_never_end_make_room(door, visitor):
    plain = []
    try:
        for _ in range(300):
            plain.append(socket.create_connection((door.address, door.port), timeout=5))
        # Taken one after the other: when those beyond the limit have been closed, the first have been taken.
        door.appliance.wait_until(lambda: sum(map(is_open, plain)) <= 256, 10, "room for 256 alone")
        time.sleep(1.1)  # so long a newcomer is left alone
        assert served(door, visitor) < LATE
    finally:
        for connection in plain:
            connection.close()


def test_a_call_that_runs_is_never_pushed_out(door, visitor):
    """Log-in takes two seconds to say no; a crowd comes meanwhile."""
    body = b'{"user":"nobody-there","password":"wrong"}'
    lines = ["POST /session/login HTTP/1.1", *fields(door), "Content-Type: application/json",
             f"Content-Length: {len(body)}", f"Cookie: {COOKIE}=x"]
    with crowd(door, 250, b"GET / HTTP/1.1\r\n") as unfinished, door.connect() as connection:
        time.sleep(1.1)  # so long a newcomer is left alone
        connection.sendall("\r\n".join(lines).encode() + b"\r\n\r\n" + body)
        with crowd(door, 25, b"GET / HTTP/1.1\r\n"):
            connection.settimeout(10)
            assert connection.recv(65536).startswith(b"HTTP/1.1 401 ")
            assert not all(map(is_open, unfinished))
