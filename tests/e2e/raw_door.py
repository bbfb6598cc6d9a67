"""Requests to the door byte by byte, as no honest client writes them, and what comes back."""

import contextlib
import http.client
import io
import re
import socket
import ssl
import time

from door import COOKIE

GET = "/webapi/VORN.Core.Directory.Domain/1/get"
STATUS_LINE = re.compile(rb"HTTP/1\.1 (\d{3}) [A-Za-z ]*")


class Part:
    """One answer of several on one connection."""

    def __init__(self, status, headers, body):
        self.status = status
        self.headers = headers
        self.body = body

    def __repr__(self):
        return f"{self.status} {self.body[:300]!r}"


def parts(data):
    """Takes what came apart into whole answers. Anything else in it is an error."""
    found = []
    while data:
        head, end, data = data.partition(b"\r\n\r\n")
        line, _, fields = head.partition(b"\r\n")
        match = STATUS_LINE.fullmatch(line)
        assert end and match, f"no answer: {head[:500]!r}"
        headers = http.client.parse_headers(io.BytesIO(fields + b"\r\n\r\n"))
        status = int(match[1])
        size = int(headers["Content-Length"]) if status not in (100, 204, 304) else 0
        assert len(data) >= size, f"cut off: {head!r} {data!r}"
        found.append(Part(status, headers, data[:size]))
        data = data[size:]
    return found


def fields(door, visitor=None, host=True):
    """The lines that a request needs beside those on trial."""
    lines = [f"Host: {door.address}:{door.port}"] if host else []
    if visitor:
        lines += [f"Cookie: {COOKIE}={visitor.cookie}", f"X-CSRF-Token: {visitor.csrf}"]
    return lines


def post(door, visitor, *lines, target=GET, version="1.1", body=b"", host=True):
    """A call; LINES are the framing. A line is text or, for what is no text, bytes."""
    head = [f"POST {target} HTTP/{version}", *fields(door, visitor, host), "Content-Type: application/json", *lines]
    return b"\r\n".join(line if isinstance(line, bytes) else line.encode() for line in head) + b"\r\n\r\n" + body


def whole(door, visitor, body=b"{}", target=GET):
    """A call as it should be."""
    return post(door, visitor, f"Content-Length: {len(body)}", target=target, body=body)


def chunked(*pieces):
    return b"".join(b"%x\r\n%s\r\n" % (len(piece), piece) for piece in pieces) + b"0\r\n\r\n"


def receive(connection, quiet=0.4, deadline=20.0):
    """What comes until the door closes, or until it has said something and then nothing for QUIET seconds. Answers the
    bytes and whether it has closed."""
    received = bytearray()
    end = time.monotonic() + deadline
    while (left := end - time.monotonic()) > 0:
        connection.settimeout(min(left, quiet) if received else left)
        try:
            piece = connection.recv(65536)
        except TimeoutError:
            break
        except (ConnectionError, ssl.SSLError):
            return bytes(received), True
        if not piece:
            return bytes(received), True
        received += piece
    return bytes(received), False


def exchange(door, data, quiet=0.4, deadline=20.0):
    """Sends bytes on a connection of their own: (answers, whether the door has closed)."""
    with door.connect(deadline) as connection:
        with contextlib.suppress(ConnectionError, ssl.SSLError):
            connection.sendall(data)
        received, closed = receive(connection, quiet, deadline)
    return parts(received), closed


def connect_from(door, source, deadline=20.0):
    """A connection from another of this machine's own addresses, 127.0.0.2 to 127.255.255.254."""
    plain = socket.create_connection((door.address, door.port), timeout=deadline, source_address=(source, 0))
    return door.tls_context().wrap_socket(plain) if door.secure else plain


def connection_from(door, source):
    """The same for whole requests: what Door.request takes as its connection."""
    connection = http.client.HTTPSConnection(door.address, door.port, timeout=60, context=door.tls_context(),
                                             source_address=(source, 0))
    assert door.secure
    return connection
