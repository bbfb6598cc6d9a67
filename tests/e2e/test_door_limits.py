"""How large a request may be: what the limits allow is served, one byte more is refused, nothing grows."""

import json

import pytest

from client import DOMAIN
from prometheus import figures_of
from raw_door import GET, chunked, exchange, fields, post, receive

HEADER = 8 * 1024
BODY = 64 * 1024


@pytest.fixture(scope="module")
def visitor(shared_door):
    return shared_door.login()


def memory(door, kind):
    """Of the door's own, in bytes."""
    text = (door.appliance.path("/proc") / str(door.pid) / "smaps_rollup").read_text()
    return 1024 * next(int(line.split()[1]) for line in text.splitlines() if line.startswith(f"{kind}:"))


def header_of(door, visitor, size, name="X-Pad"):
    """A call whose header has exactly SIZE bytes."""
    empty = post(door, visitor, f"{name}: ", "Content-Length: 2")
    return post(door, visitor, f"{name}: " + "a" * (size - len(empty)), "Content-Length: 2", body=b"{}")


def status_of(door, data):
    answers, closed = exchange(door, data)
    assert len(answers) == 1, answers
    return answers[0].status, json.loads(answers[0].body).get("error", {}).get("code"), closed


def test_a_header_at_the_edge(shared_door, visitor):
    assert status_of(shared_door, header_of(shared_door, visitor, HEADER)) == (200, None, False)
    assert status_of(shared_door, header_of(shared_door, visitor, HEADER + 1)) == (413, 216, True)


def test_a_first_line_at_the_edge(shared_door):
    rest = "\r\n".join([" HTTP/1.1", *fields(shared_door)]).encode() + b"\r\n\r\n"
    for size, expected in ((HEADER, (404, 213, False)), (HEADER + 1, (413, 216, True))):
        path = b"/" + b"a" * (size - len(rest) - len(b"GET /"))
        assert status_of(shared_door, b"GET " + path + rest) == expected


def test_many_fields(shared_door, visitor):
    def with_fields(count):
        return post(shared_door, visitor, *(f"a{number}:" for number in range(count)), "Content-Length: 2", body=b"{}")

    assert status_of(shared_door, with_fields(900)) == (200, None, False)
    assert status_of(shared_door, with_fields(3000)) == (413, 216, True)


def test_a_header_without_an_end(shared_door):
    for piece in (b"X: " + b"a" * 100 + b"\r\n", b"a" * 100, b"\r\n", b"X:\r\n"):
        status, code, closed = status_of(shared_door, b"GET / HTTP/1.1\r\n" + piece * (200000 // len(piece)))
        assert (status, closed) in ((413, True), (400, True)) and code in (200, 216), piece[:10]


def json_of(size):
    return b'{"pad":"' + b"a" * (size - 10) + b'"}'


def test_a_body_at_the_edge(shared_door, visitor):
    def with_length(size, *more):
        return post(shared_door, visitor, f"Content-Length: {size}", *more, body=json_of(size))

    assert status_of(shared_door, with_length(BODY)) == (200, None, False)
    assert status_of(shared_door, with_length(BODY + 1)) == (413, 217, True)
    assert status_of(shared_door, with_length(40 * BODY)) == (413, 217, True)


def test_a_body_that_is_only_announced(shared_door, visitor):
    """The refusal does not wait for it, and nobody is asked to go on."""
    for size in (BODY + 1, 10**12, 2**63):
        data = post(shared_door, visitor, f"Content-Length: {size}", "Expect: 100-continue")
        answers, closed = exchange(shared_door, data, deadline=5)
        assert [answer.status for answer in answers] == [413] and closed, size


def test_a_chunked_body_at_the_edge(shared_door, visitor):
    def with_chunks(size, at_a_time):
        content = json_of(size)
        pieces = [content[place:place + at_a_time] for place in range(0, size, at_a_time)]
        return post(shared_door, visitor, "Transfer-Encoding: chunked", body=chunked(*pieces))

    for at_a_time in (BODY * 2, 1000, 1):
        assert status_of(shared_door, with_chunks(BODY, at_a_time)) == (200, None, False), at_a_time
        assert status_of(shared_door, with_chunks(BODY + 1, at_a_time)) == (413, 217, True), at_a_time


def test_what_is_beside_the_chunks_has_an_end_too(shared_door, visitor):
    large = b"a" * 100000
    for body in (b"2;" + large + b"\r\n{}\r\n0\r\n\r\n",
                 b"2\r\n{}\r\n0\r\nX: " + large + b"\r\n\r\n",
                 b"2\r\n{}\r\n0\r\n" + b"X: a\r\n" * 20000 + b"\r\n",
                 b"0" * 100000 + b"2\r\n{}\r\n0\r\n\r\n"):
        status, _, closed = status_of(shared_door, post(shared_door, visitor, "Transfer-Encoding: chunked", body=body))
        assert status in (400, 413) and closed, body[:20]


def test_the_body_of_what_takes_none(shared_door):
    """Also a page's file and an unknown path take no more than a call does."""
    for target in ("/", "/nothing"):
        lines = [f"GET {target} HTTP/1.1", *fields(shared_door), f"Content-Length: {BODY + 1}"]
        status, _, closed = status_of(shared_door, "\r\n".join(lines).encode() + b"\r\n\r\n" + b"a" * (BODY + 1))
        assert (status, closed) == (413, True)


def test_the_client_that_goes_on_sends_and_still_gets_its_answer(shared_door, visitor):
    data = post(shared_door, visitor, "Content-Length: 3000000")
    with shared_door.connect() as connection:
        connection.sendall(data + b"a" * 200000)
        received, closed = receive(connection)
    assert received.startswith(b"HTTP/1.1 413 ") and closed


def test_an_answer_says_what_was_wrong(shared_door, visitor):
    deep = b'{"a":' * 10 + b"{}" + b"}" * 10
    for body, code in ((deep, 202), (b'{"a":1,"a":2}', 203), (b"[]", 204), (b"nonsense", 201), (b"\xff", 201)):
        reply = visitor.request("POST", GET, body)
        assert (reply.status, reply.code) == (400, code), body
    for kind in ("text/plain", "application/x-www-form-urlencoded", "multipart/form-data; boundary=x", None, "json"):
        reply = visitor.request("POST", GET, {}, {"Content-Type": kind})
        assert (reply.status, reply.code) == (415, 218), kind
    reply = visitor.request("POST", GET, {}, {"Content-Encoding": "gzip"})
    assert (reply.status, reply.code) == (415, 218)
    assert visitor.request("POST", GET, {}, {"Content-Type": "Application/JSON; charset=utf-8"}).status == 200


def test_nothing_has_grown(shared_door, visitor):
    """After large, broken and endless requests."""
    # The share in the libraries grows when another program that has them ends.
    before = memory(shared_door, "Anonymous")
    calls = figures_of(shared_door.appliance).total("vorn_request_seconds_count", api=DOMAIN, method="get")
    for _ in range(30):
        exchange(shared_door, b"GET / HTTP/1.1\r\n" + b"X: " + b"a" * 100000)
        exchange(shared_door, post(shared_door, visitor, f"Content-Length: {BODY * 2}", body=b"a" * BODY * 2))
        exchange(shared_door, post(shared_door, visitor, "Transfer-Encoding: chunked", body=b"ffff\r\n" + b"a" * 90000))
    assert memory(shared_door, "Anonymous") < before + 2 * 2**20
    assert memory(shared_door, "Pss") < 16 * 2**20
    assert figures_of(shared_door.appliance).total("vorn_request_seconds_count", api=DOMAIN, method="get") == calls
