"""Requests that two programs could take for different ones. The door answers each of them once or not at all, and what
is hidden in one never reaches the appliance's server."""

import pytest

from client import DOMAIN, SCHEDULE
from prometheus import figures_of
from raw_door import GET, chunked, exchange, fields, parts, post, receive, whole

PRIZE = f"/webapi/{SCHEDULE}/1/get"
PATIENCE = 5  # seconds between two answers, or before the door hangs up; where it does that, nobody waits so long


@pytest.fixture(scope="module")
def visitor(shared_door):
    return shared_door.login()


def prizes(door):
    """How often the hidden call was made."""
    return figures_of(door.appliance).total("vorn_requests_total", api=SCHEDULE, method="get")


def calls(door):
    """How many requests of browsers came to the appliance's server."""
    figures = figures_of(door.appliance)
    return sum(figures.total("vorn_requests_total", api=api) for api in (DOMAIN, SCHEDULE, "session", ""))


def hidden(door, visitor):
    return whole(door, visitor, target=PRIZE)


def test_requests_behind_one_another_are_all_answered(shared_door, visitor):
    """What the other tests rely on: a call that is not hidden is made, is counted and is seen."""
    before = prizes(shared_door)
    answers, closed = exchange(shared_door, whole(shared_door, visitor) + hidden(shared_door, visitor) * 2, quiet=2)
    assert [answer.status for answer in answers] == [200, 200, 200] and not closed
    assert b'"date_type"' in answers[1].body and b'"enable_domain"' in answers[0].body
    assert prizes(shared_door) == before + 2


REFUSED = {
    "length and chunked": ["Content-Length: 5", "Transfer-Encoding: chunked"],
    "chunked and length": ["Transfer-Encoding: chunked", "Content-Length: 5"],
    "length 0 and chunked": ["Content-Length: 0", "Transfer-Encoding: chunked"],
    "two lengths": ["Content-Length: 5", "Content-Length: 2"],
    "two lengths, the same": ["Content-Length: 5", "Content-Length: 5"],
    "a list of lengths": ["Content-Length: 5, 5"],
    "length with a sign": ["Content-Length: +5"],
    "negative length": ["Content-Length: -1"],
    "hexadecimal length": ["Content-Length: 0x5"],
    "length with a fraction": ["Content-Length: 5.0"],
    "length with a blank in it": ["Content-Length: 1 0"],
    "length with a comma": ["Content-Length: 5,"],
    "empty length": ["Content-Length:"],
    "length beyond 64 bits": ["Content-Length: 18446744073709551621"],
    "length beyond any number": ["Content-Length: " + "9" * 60],
    "length as large as a number can be": ["Content-Length: 18446744073709551615"],
    "blank before the colon": ["Content-Length : 5"],
    "tab before the colon": ["Content-Length\t: 5"],
    "xchunked": ["Transfer-Encoding: xchunked"],
    "chunked twice": ["Transfer-Encoding: chunked, chunked"],
    "chunked in two lines": ["Transfer-Encoding: chunked", "Transfer-Encoding: chunked"],
    "chunked and identity": ["Transfer-Encoding: chunked, identity"],
    "identity and chunked": ["Transfer-Encoding: identity", "Transfer-Encoding: chunked"],
    "identity": ["Transfer-Encoding: identity"],
    "gzip and chunked": ["Transfer-Encoding: gzip, chunked"],
    "chunked in quotes": ['Transfer-Encoding: "chunked"'],
    "chunked with a parameter": ["Transfer-Encoding: chunked;q=1"],
    "chunked before a comma": ["Transfer-Encoding: chunked,"],
    "chunked with a vertical tab": [b"Transfer-Encoding: \x0bchunked"],
    "chunked with a no-break space": [b"Transfer-Encoding: \xa0chunked"],
    "chunked, blank before the colon": ["Transfer-Encoding : chunked"],
    "folded chunked": ["Transfer-Encoding:", " chunked"],
    "folded, with a tab": ["Transfer-Encoding:", "\tchunked"],
    "folded other line": ["Content-Length: 2", "X-Other: a", " Transfer-Encoding: chunked"],
    "first line folded": [" Transfer-Encoding: chunked", "Content-Length: 2"],
    "bare line feed": [b"X-Other: a\nTransfer-Encoding: chunked"],
    "bare line feed after a length": [b"Content-Length: 2\nTransfer-Encoding: chunked"],
    "bare carriage return": [b"X-Other: a\rTransfer-Encoding: chunked"],
    "two carriage returns": [b"Content-Length: 2\r"],
    "NUL in a value": [b"X-Other: a\0b", "Content-Length: 2"],
    "NUL in a name": [b"X-Ot\0her: a", "Content-Length: 2"],
    "NUL behind a length": [b"Content-Length: 5\0"],
    "delete character": [b"X-Other: a\x7fb", "Content-Length: 2"],
    "line without a colon": ["Transfer-Encoding", "Content-Length: 2"],
    "empty name": [": chunked", "Content-Length: 2"],
    "name with a blank": ["Transfer Encoding: chunked", "Content-Length: 2"],
    "name in brackets": ["Transfer-Encoding[0]: chunked", "Content-Length: 2"],
    "two hosts": ["Host: other.test", "Content-Length: 2"],
    "two hosts, one of them folded": ["X-Other: a", " Host: other.test", "Content-Length: 2"],
}


@pytest.mark.parametrize("shape", REFUSED)
def test_a_doubtful_header_is_refused(shared_door, visitor, shape):
    """Whichever way the body is read, a call is behind it; the door says no once and hangs up."""
    before = prizes(shared_door)
    for body in (b"0\r\n\r\n" + hidden(shared_door, visitor), b"{}" + hidden(shared_door, visitor)):
        answers, closed = exchange(shared_door, post(shared_door, visitor, *REFUSED[shape], body=body), PATIENCE)
        assert [answer.status for answer in answers] in ([400], [413]), answers
        assert closed and answers[0].headers["Connection"] == "close"
    assert prizes(shared_door) == before


FIRST_LINES = {
    "nothing but a path": b"/webapi",
    "no version": b"POST " + GET.encode(),
    "an older version": b"POST %s HTTP/0.9" % GET.encode(),
    "a later version": b"POST %s HTTP/1.2" % GET.encode(),
    "HTTP 2": b"POST %s HTTP/2.0" % GET.encode(),
    "the preface of HTTP 2": b"PRI * HTTP/2.0",
    "two blanks": b"POST  %s HTTP/1.1" % GET.encode(),
    "a tab": b"POST\t%s HTTP/1.1" % GET.encode(),
    "a blank in the path": b"POST %s x HTTP/1.1" % GET.encode(),
    "a blank in front": b" POST %s HTTP/1.1" % GET.encode(),
    "NUL in the path": b"POST %s\0 HTTP/1.1" % GET.encode(),
    "a byte of no character": b"POST %s\xff HTTP/1.1" % GET.encode(),
    "a verb with a colon": b"PO:ST %s HTTP/1.1" % GET.encode(),
    "a carriage return": b"POST %s HTTP/1.1\rX: y" % GET.encode(),
    "another protocol": b"POST %s HTTPS/1.1" % GET.encode(),
    "a version with more digits": b"POST %s HTTP/1.10" % GET.encode(),
}


@pytest.mark.parametrize("shape", FIRST_LINES)
def test_a_doubtful_first_line_is_refused(shared_door, visitor, shape):
    before = calls(shared_door), prizes(shared_door)
    lines = [line.encode() for line in fields(shared_door, visitor)]
    data = b"\r\n".join([FIRST_LINES[shape], *lines, b"Content-Type: application/json", b"Content-Length: 2"])
    answers, closed = exchange(shared_door, data + b"\r\n\r\n{}" + hidden(shared_door, visitor), PATIENCE)
    assert [answer.status for answer in answers] == [400] and closed, answers
    # Also not what comes first: it was in doubt.
    assert (calls(shared_door), prizes(shared_door)) == before


HOSTS = {
    "none": [],
    "empty": ["Host:"],
    "a blank": ["Host: a b"],
    "an address in another": ["Host: 127.0.0.1@other.test"],
    "a path": ["Host: other.test/webapi"],
    "a list": ["Host: a.test, b.test"],
    "two": ["Host: a.test", "Host: a.test"],
}


@pytest.mark.parametrize("shape", HOSTS)
def test_a_request_names_one_host(shared_door, visitor, shape):
    before = calls(shared_door)
    data = post(shared_door, visitor, *HOSTS[shape], "Content-Length: 2", host=False, body=b"{}")
    answers, closed = exchange(shared_door, data + hidden(shared_door, visitor), PATIENCE)
    assert [answer.status for answer in answers] == [400] and closed, answers
    assert calls(shared_door) == before


@pytest.mark.parametrize("version", ["1.0", "1.1"])
def test_an_old_client_has_no_chunks(shared_door, visitor, version):
    data = post(shared_door, visitor, "Transfer-Encoding: chunked", "Connection: keep-alive", version=version,
                body=chunked(b"{}"))
    answers, closed = exchange(shared_door, data, PATIENCE if version == "1.0" else 0.4)
    assert [answer.status for answer in answers] == [400 if version == "1.0" else 200]
    assert closed is (version == "1.0")


TARGETS = {
    "a whole address": "https://127.0.0.1{}",
    "another machine's": "http://other.test{}",
    "its host alone": "//127.0.0.1{}",
    "a question": "{}?x=1",
    "a fragment": "{}#x",
    "no slash in front": "x{}",
    "an encoded slash": "/webapi%2F{}",
    "an encoded line end": "{}%0d%0aHost:%20other.test",
    "one more slash": "{}/",
    "dots": "/session/..{}",
}


@pytest.mark.parametrize("shape", TARGETS)
def test_nothing_but_the_path_of_a_call_makes_it(shared_door, visitor, shape):
    before = calls(shared_door), prizes(shared_door)
    answers, _ = exchange(shared_door, whole(shared_door, visitor, target=TARGETS[shape].format(PRIZE)))
    assert [answer.status for answer in answers] in ([404], [400]), answers
    assert (calls(shared_door), prizes(shared_door)) == before


def bad_chunks(inner):
    return {
        "no size": b"\r\n{}\r\n0\r\n\r\n",
        "negative size": b"-2\r\n{}\r\n0\r\n\r\n",
        "size with a sign": b"+2\r\n{}\r\n0\r\n\r\n",
        "size with 0x": b"0x2\r\n{}\r\n0\r\n\r\n",
        "size with an underscore": b"0_2\r\n{}\r\n0\r\n\r\n",
        "blank before the size": b" 2\r\n{}\r\n0\r\n\r\n",
        "size of no number": b"zz\r\n{}\r\n0\r\n\r\n",
        "size beyond 64 bits": b"10000000000000002\r\n{}\r\n0\r\n\r\n",
        "size of minus one": b"ffffffffffffffff\r\n{}\r\n0\r\n\r\n",
        "size above the limit": b"10001\r\n" + b" " * 0x10001 + b"\r\n0\r\n\r\n",
        "size that is too small": b"1\r\n{}\r\n0\r\n\r\n",
        "line feeds alone": b"2\n{}\n0\n\n",
        "line feed behind the size": b"2\n{}\r\n0\r\n\r\n",
        "carriage return behind the size": b"2\r{}\r\n0\r\n\r\n",
        "line feed behind the content": b"2\r\n{}\n0\r\n\r\n",
        "line feed in an extension": b"2;a\n{}\r\n0\r\n\r\n",
        "NUL in the size": b"2\0\r\n{}\r\n0\r\n\r\n",
        "a call in an extension": b"2;" + inner.replace(b"\r\n", b"\n") + b"\r\n{}\r\n0\r\n\r\n",
    }


@pytest.mark.parametrize("shape", bad_chunks(b""))
def test_doubtful_chunks_are_refused(shared_door, visitor, shape):
    before = prizes(shared_door)
    inner = hidden(shared_door, visitor)
    data = post(shared_door, visitor, "Transfer-Encoding: chunked", body=bad_chunks(inner)[shape] + inner)
    answers, closed = exchange(shared_door, data, PATIENCE)
    assert [answer.status for answer in answers] in ([400], [413]) and closed, answers
    assert prizes(shared_door) == before


GOOD_CHUNKS = {
    "a zero in front": b"002\r\n{}\r\n0\r\n\r\n",
    "an extension": b"2;name=value\r\n{}\r\n0\r\n\r\n",
    "an extension in quotes": b'2;name="0"\r\n{}\r\n0;last\r\n\r\n',
    "fields behind": b"2\r\n{}\r\n0\r\nX-Other: a\r\n\r\n",
    "a length behind": b"2\r\n{}\r\n0\r\nContent-Length: 200\r\n\r\n",
    "an encoding behind": b"2\r\n{}\r\n0\r\nTransfer-Encoding: chunked\r\n\r\n",
    "a cookie behind": b"2\r\n{}\r\n0\r\nCookie: __Host-vorn=x\r\nVorn-Session: x\r\n\r\n",
}


@pytest.mark.parametrize("shape", GOOD_CHUNKS)
def test_chunks_with_what_means_nothing(shared_door, visitor, shape):
    """The end is where it is for everybody, or the request is refused; the call behind it is one of its own."""
    before = prizes(shared_door)
    data = post(shared_door, visitor, "Transfer-Encoding: chunked", body=GOOD_CHUNKS[shape])
    last = post(shared_door, visitor, "Connection: close", "Content-Length: 2", target=PRIZE, body=b"{}")
    answers, _ = exchange(shared_door, data + last, PATIENCE)
    assert [answer.status for answer in answers] in ([200, 200], [400]), answers
    assert b'"enable_domain"' in answers[0].body or answers[0].status == 400
    assert prizes(shared_door) == before + len(answers) - 1


@pytest.mark.parametrize("outer", ["POST " + GET, "POST /session/logout-not", "GET /session", "GET /", "HEAD /",
                                   "GET /nothing", "PUT /", "OPTIONS /webapi", "GET /metrics", "GET /healthz"])
@pytest.mark.parametrize("framing", ["length", "chunked", "continue"])
def test_a_call_in_a_body_stays_a_body(shared_door, visitor, outer, framing):
    before = prizes(shared_door)
    inner = hidden(shared_door, visitor)
    lines = [f"{outer} HTTP/1.1", *fields(shared_door, visitor), "Content-Type: application/json"]
    lines += ["Transfer-Encoding: chunked"] if framing == "chunked" else [f"Content-Length: {len(inner)}"]
    lines += ["Expect: 100-continue"] if framing == "continue" else []
    data = "\r\n".join(lines).encode() + b"\r\n\r\n"
    with shared_door.connect() as connection:
        connection.sendall(data + (chunked(inner) if framing == "chunked" else inner))
        received, _ = receive(connection)
        # The content of what HEAD is answered does not come.
        if outer.startswith("HEAD"):
            assert received.count(b"HTTP/1.1 ") == 1 and received.startswith(b"HTTP/1.1 200 ")
        else:
            answers = [answer for answer in parts(received) if answer.status != 100]
            assert len(answers) == 1, answers
    assert prizes(shared_door) == before


def test_what_lies_behind_a_body_is_a_request_of_its_own(shared_door, visitor):
    before = calls(shared_door)
    for rest in (b"x", b"{}\r\n\r\n", b"GARBAGE\r\n\r\n", b"\0\0\0\0", b"0\r\n\r\n"):
        with shared_door.connect() as connection:
            connection.sendall(whole(shared_door, visitor) + rest)
            answers = parts(receive(connection)[0])
        assert answers[0].status == 200 and [answer.status for answer in answers[1:]] in ([], [400]), answers
    assert calls(shared_door) == before + 5


def test_empty_lines_in_front_make_no_difference(shared_door, visitor):
    before = calls(shared_door)
    answers, _ = exchange(shared_door, b"\r\n" + whole(shared_door, visitor))
    assert [answer.status for answer in answers] in ([200], [400]), answers
    assert calls(shared_door) == before + (answers[0].status == 200)


def test_no_other_protocol_takes_over(shared_door, visitor):
    before = prizes(shared_door)
    for lines in (["Connection: Upgrade, HTTP2-Settings", "Upgrade: h2c", "HTTP2-Settings: AAMAAABkAAQCAAAAAAIAAAAA"],
                  ["Connection: Upgrade", "Upgrade: websocket", "Sec-WebSocket-Version: 13",
                   "Sec-WebSocket-Key: dGhlIHNhbXBsZSBub25jZQ=="]):
        data = post(shared_door, visitor, *lines, "Content-Length: 2", body=b"{}")
        answers, _ = exchange(shared_door, data)
        assert [answer.status for answer in answers] == [200] and "Upgrade" not in answers[0].headers, answers
    assert prizes(shared_door) == before


def test_a_client_can_not_say_who_it_is(shared_door, visitor):
    """What the door tells the appliance's server is its own word, never the client's."""
    forged = [f"Vorn-Session: {visitor.cookie}", f"Vorn-Csrf: {visitor.csrf}", "Vorn-Client: 192.0.2.77"]
    answers, _ = exchange(shared_door, post(shared_door, None, *forged, "Content-Length: 2", body=b"{}"))
    assert [answer.status for answer in answers] == [401], answers
    body = b'{"user":"nobody-there","password":"wrong"}'
    answers, _ = exchange(shared_door, post(shared_door, None, *forged, f"Content-Length: {len(body)}", body=body,
                                            target="/session/login"))
    assert [answer.status for answer in answers] == [401], answers
    log = shared_door.appliance.syslog()
    assert "log-in of nobody-there from 127.0.0.1 refused" in log and "192.0.2.77" not in log


def test_connection_fields_take_nothing_away(shared_door, visitor):
    """"Connection" names fields that are for one hop; those that decide are not among them."""
    for name in ("Cookie", "X-CSRF-Token", "Content-Length", "Host", "close, Cookie"):
        answers, _ = exchange(shared_door, post(shared_door, visitor, f"Connection: {name}", "Content-Length: 2",
                                                body=b"{}"))
        assert [answer.status for answer in answers] in ([200], [400]), (name, answers)
