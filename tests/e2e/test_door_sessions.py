"""Sessions seen from a browser: how one begins, what it is tied to, and how it ends."""

import contextlib
import hashlib
import json
import re
import secrets
import signal
import subprocess
import time

import pytest

from client import CONF, DOMAIN
from door import COOKIE, Visitor
from processes import programs
from raw_door import GET, exchange, post, whole

FILE = "/run/vorn/sessions.json"
IDLE = 15 * 60
ABSOLUTE = 12 * 60 * 60


def forged():
    return secrets.token_urlsafe(32)


# How a session begins.

def test_the_cookie_is_for_this_door_alone(shared_door):
    visitor = shared_door.visitor()
    reply = visitor.login()
    assert len(reply.cookies) == 1
    value, *attributes = [part.strip() for part in reply.cookies[0].split(";")]
    assert re.fullmatch(rf"{COOKIE}=[A-Za-z0-9_-]{{43}}", value)
    assert sorted(attributes) == ["HttpOnly", "Path=/", "SameSite=Strict", "Secure"]
    assert visitor.cookie not in reply.body.decode() and set(reply.json["data"]) == {
        "csrf", "user", "idle_seconds", "expires"}
    assert reply.headers["Cache-Control"] == "no-store"
    assert reply.json["data"]["idle_seconds"] == IDLE
    assert abs(reply.json["data"]["expires"] - time.time() - ABSOLUTE) < 30
    # Nothing but a log-in and a log-out touches it.
    for other in (visitor.session(), visitor.request("POST", GET), shared_door.get("/"), visitor.request("GET", "/x")):
        assert other.cookies == []
    reply = visitor.logout()
    assert len(reply.cookies) == 1 and "Max-Age=0" in reply.cookies[0] and "Secure" in reply.cookies[0]


def test_a_cookie_that_is_brought_along_is_not_adopted(shared_door):
    visitor = shared_door.visitor()
    planted = visitor.cookie = forged()
    assert visitor.session().code == 220
    assert visitor.login().status == 200
    assert visitor.cookie != planted
    thief = shared_door.visitor()
    thief.cookie = planted
    assert thief.session().code == 220
    visitor.logout()


def test_each_login_has_a_session_of_its_own(shared_door):
    """Also one in a browser that has a session: that one ends, so that nobody else stays in it."""
    visitor = shared_door.login()
    former = shared_door.visitor()
    former.cookie, former.csrf = visitor.cookie, visitor.csrf
    assert former.session().status == 200
    assert visitor.login().status == 200
    assert visitor.cookie != former.cookie and visitor.csrf != former.csrf
    assert former.session().code == 220 and former.call(DOMAIN, 1, "get").code == 220
    other = shared_door.login()
    assert other.cookie != visitor.cookie and other.csrf != visitor.csrf
    assert visitor.session().status == other.session().status == 200
    visitor.logout()
    other.logout()


@pytest.mark.parametrize("cookie", [
    "{other}", "{own}x", "{own}; {own}", "{other}; {own}", "{own}; {other}", '"{value}"', "{lower}={value}",
    "{name}", "{name}=", "{name}={value}=", "{name}={value} x", "x={value}", "{name}={value}%00",
])
def test_a_cookie_in_doubt_is_none(shared_door, visitor, cookie):
    text = cookie.format(own=f"{COOKIE}={visitor.cookie}", other=f"{COOKIE}={forged()}", value=visitor.cookie,
                         name=COOKIE, lower=COOKIE.lower())
    reply = shared_door.get("/session", headers={"Cookie": text})
    assert (reply.status, reply.code) == (401, 220)


@pytest.fixture(scope="module")
def visitor(shared_door):
    """On one connection."""
    one = Visitor(shared_door, keep=True)
    assert one.login().status == 200
    return one


def test_other_cookies_do_not_matter(shared_door, visitor):
    text = f"theme=dark; {COOKIE}={visitor.cookie}; __Host-other=1"
    assert shared_door.get("/session", headers={"Cookie": text}).status == 200


# What a call needs beside the cookie.

def test_nothing_is_open_without_a_session(shared_door):
    stranger = shared_door.visitor()
    for method, path in (("GET", "/webapi"), ("GET", "/webapi/openapi.json"), ("GET", "/session"), ("POST", GET),
                         ("POST", "/session/logout"), ("POST", "/webapi/x/1/y")):
        for cookie in (None, forged(), "x", ""):
            stranger.cookie, stranger.csrf = cookie, forged()
            reply = stranger.request(method, path)
            assert (reply.status, reply.code) == (401, 220), (method, path, cookie)


def test_a_call_carries_the_token_of_its_own_session(shared_door, visitor):
    other = shared_door.login()
    for token in (None, "", forged(), other.csrf, visitor.cookie, visitor.csrf[:-1], visitor.csrf + "x",
                  visitor.csrf.swapcase()):
        for path in (GET, "/session/logout"):
            reply = visitor.request("POST", path, headers={"X-CSRF-Token": token})
            assert (reply.status, reply.code) == (403, 221), (path, token)
    assert visitor.session().status == 200
    # Not in the path, in the body, in a cookie or twice.
    lines = [f"Cookie: {COOKIE}={visitor.cookie}; csrf={visitor.csrf}", f"X-CSRF-Token: {other.csrf}",
             f"X-CSRF-Token: {visitor.csrf}", "Content-Length: 2"]
    answers, _ = exchange(shared_door, post(shared_door, None, *lines, body=b"{}"))
    assert [answer.status for answer in answers] == [403]
    reply = visitor.request("POST", GET, {"csrf": visitor.csrf, "X-CSRF-Token": visitor.csrf},
                            {"X-CSRF-Token": None, "Cookie": f"{COOKIE}={visitor.cookie}; csrf={visitor.csrf}"})
    assert reply.code == 221
    assert visitor.call(DOMAIN, 1, "get").ok
    other.logout()


def test_pages_of_other_addresses_are_refused(shared_door, visitor):
    own = shared_door.url
    bad = ["null", "https://evil.test", own.replace("https:", "http:"), own + ".evil.test", own[:-1],
           f"https://localhost:{shared_door.port}", f"https://{shared_door.address}", own + "/", "",
           f"{own}, {own}", f"{own} {own}"]
    for origin in bad:
        for path, body in ((GET, {}), ("/session/login", {"user": "admin", "password": "x"}), ("/session/logout", {}),
                           ("/session/link", {"token": "x"})):
            reply = visitor.request("POST", path, body, {"Origin": origin})
            assert (reply.status, reply.code) == (403, 251), (path, origin)
    for site in ("cross-site", "same-site", "", "Same-Origin", "same-origin, none"):
        reply = visitor.request("POST", GET, {}, {"Sec-Fetch-Site": site})
        assert (reply.status, reply.code) == (403, 251), site
    assert visitor.session().status == 200
    # What is no browser sends neither; a page that was typed into the address line has no site.
    for headers in ({"Origin": None, "Sec-Fetch-Site": None}, {"Sec-Fetch-Site": "none"}, {"Origin": own.upper()}):
        assert visitor.request("POST", GET, {}, headers).status == 200, headers


def test_a_name_that_was_rebound_gets_no_session(shared_door, visitor):
    """Who has let his own name point here sends that name as the host, and the page's origin fits to it; but the
    browser has no cookie for it."""
    headers = {"Host": "evil.test", "Origin": "https://evil.test"}
    assert shared_door.request("POST", GET, {}, headers).code == 220
    # Were the door known by that name, the origin had to be the same.
    assert visitor.request("POST", GET, {}, {"Host": "evil.test"}).code == 251


def test_no_other_site_may_read_answers(shared_door, visitor):
    for path in ("/session", "/webapi", "/", "/healthz"):
        reply = visitor.request("GET", path, headers={"Origin": "https://evil.test"})
        assert not [name for name in reply.headers if name.lower().startswith("access-control-")], path
        reply = shared_door.request("OPTIONS", path, headers={
            "Origin": "https://evil.test", "Access-Control-Request-Method": "POST",
            "Access-Control-Request-Headers": "content-type,x-csrf-token"})
        assert reply.status == 405
        assert not [name for name in reply.headers if name.lower().startswith("access-control-")], path


# How a session ends.

def test_a_logout_ends_the_session_everywhere(shared_door):
    visitor = shared_door.login()
    copy = shared_door.visitor()
    copy.cookie, copy.csrf = visitor.cookie, visitor.csrf
    with shared_door.connect() as kept:
        kept.sendall(whole(shared_door, copy))
        assert kept.recv(65536).startswith(b"HTTP/1.1 200 ")
        assert visitor.logout().status == 200
        kept.sendall(whole(shared_door, copy))
        assert kept.recv(65536).startswith(b"HTTP/1.1 401 ")
    assert copy.session().code == 220 and copy.call(CONF, 1, "get").code == 220
    assert copy.logout().code == 220
    assert hashlib.sha256(copy.cookie.encode()).hexdigest().encode() not in shared_door.appliance.read(FILE)


def test_the_sixty_fifth_session_ends_the_one_unused_for_longest(shared_door, visitor):
    visitors = []
    for _ in range(64):
        visitors.append(shared_door.visitor())
        visitors[-1].connection = visitor.connection
        assert visitors[-1].login_with(shared_door.new_link()).status == 200
    time.sleep(1.1)  # uses are told apart by the second
    assert visitors[0].session().status == 200
    time.sleep(1.1)
    one_more = shared_door.visitor()
    assert one_more.login_with(shared_door.new_link()).status == 200
    states = [each.session().status for each in visitors]
    assert states.count(401) == 1 and states[0] == 200, states
    assert visitor.session().status == 401
    for each in (*visitors, one_more):
        each.logout()


# Sessions and restarts of the appliance's server.

def running(machine):
    with contextlib.suppress(OSError):
        return machine.client.request("GET", "/webapi", deadline=2)[0] == 200
    return False


@contextlib.contextmanager
def later(machine, seconds):
    """The server on a clock that is ahead. Hosts of the lab may not set clocks, so this comes from outside."""
    init = str(machine.lab.init(machine.host))
    script = 'exec >/dev/null 2>&1 </dev/null; setsid unshare --time --boottime "$1" --fork /usr/vorn/sbin/vornd &'
    subprocess.run(["nsenter", "--target", init, "--pid", "--mount", "--net", "--uts", "--ipc", "--root", "--wd", "--",
                    "sh", "-c", script, "later", str(seconds)], check=True, timeout=20)
    try:
        machine.wait_until(lambda: running(machine), 20, "the server")
        yield
    finally:
        for process in programs(machine, "vornd"):
            process.signal(signal.SIGTERM)
        machine.wait_until(lambda: not programs(machine, "vornd"), 30, "the server's end")


@contextlib.contextmanager
def stopped(machine):
    machine.stop()
    try:
        yield
    finally:
        machine.start()


def test_sessions_outlive_the_server(shared_door):
    machine = shared_door.appliance
    visitor = shared_door.login()
    stored = machine.must("stat", "-c", "%U %G %a %F", FILE).out
    assert stored == "root root 600 regular file\n"
    content = machine.read(FILE).decode()
    assert visitor.cookie not in content and hashlib.sha256(visitor.cookie.encode()).hexdigest() in content
    for end in (machine.stop, machine.kill):
        end()
        machine.start()
        assert visitor.session().json["data"]["user"] == "admin"
        assert visitor.call(DOMAIN, 1, "get").ok
    visitor.logout()
    machine.kill()
    machine.start()
    assert visitor.session().code == 220


DAMAGES = {
    "empty": lambda text: b"",
    "cut off": lambda text: text[:-20],
    "nonsense": lambda text: b"\0" * 100,
    "a list": lambda text: b"[]",
    "a hash of another length": lambda text: text.replace(b'"hash":"', b'"hash":"00'),
    "a key twice": lambda text: text.replace(b'"user":"admin"', b'"user":"admin","user":"root"'),
    "another boot": lambda text: re.sub(rb'"boot":"[^"]*"', b'"boot":"another"', text),
}


def test_damaged_sessions_are_none(shared_door):
    machine = shared_door.appliance
    for name, damage in DAMAGES.items():
        visitor = shared_door.visitor()
        assert visitor.login_with(shared_door.new_link()).status == 200
        begin = len(machine.syslog())
        with stopped(machine):
            text = machine.read(FILE)
            damaged = damage(text.replace(b'"user":"root"', b'"user":"admin"'))
            assert damaged != text, name
            machine.write(FILE, damaged)
        reply = visitor.session()
        assert (reply.status, reply.code) == (401, 220), name
        assert name == "another boot" or f"{FILE} is damaged" in machine.syslog()[begin:], name
    assert shared_door.login().logout().status == 200


def test_sessions_that_others_could_have_written_are_none(shared_door):
    machine = shared_door.appliance
    for change in (["chmod", "644"], ["chmod", "620"], ["chown", "vorn-httpd"]):
        visitor = shared_door.visitor()
        assert visitor.login_with(shared_door.new_link()).status == 200
        with stopped(machine):
            machine.must(*change, FILE)
        assert visitor.session().code == 220, change


def test_a_session_ends_when_it_is_not_used(shared_door):
    """And what the page asks by itself is no use."""
    machine = shared_door.appliance
    used, unused = shared_door.login(), shared_door.login()
    machine.stop()
    try:
        with later(machine, 600):
            assert used.call(DOMAIN, 1, "get").ok
            assert unused.call(DOMAIN, 1, "get", background=True).ok
            assert unused.request("GET", "/session", headers={"X-Background": "1"}).status == 200
        with later(machine, 880):
            assert unused.call(DOMAIN, 1, "get", background=True).ok
        with later(machine, IDLE):
            assert used.session().status == 200
            assert unused.session().code == 220 and unused.call(DOMAIN, 1, "get").code == 220
        with later(machine, 900 + IDLE):
            assert used.session().code == 220
    finally:
        machine.start()


def test_a_session_ends_after_twelve_hours_however_much_it_is_used(shared_door):
    machine = shared_door.appliance
    machine.stop()
    try:
        with later(machine, 2 * ABSOLUTE):
            visitor = shared_door.login()
        stored = json.loads(machine.read(FILE))
        stored["sessions"][-1]["begun"] -= ABSOLUTE - 12
        machine.write(FILE, json.dumps(stored))
        with later(machine, 2 * ABSOLUTE):
            assert visitor.call(DOMAIN, 1, "get").ok
            machine.wait_until(lambda: not visitor.call(DOMAIN, 1, "get").ok, 15, "the end of the session")
            assert visitor.session().code == 220
    finally:
        machine.start()
