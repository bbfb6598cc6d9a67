"""Log-in: who gets in, what guessing costs, links that work once, and that no secret is left anywhere."""

import concurrent.futures
import hashlib
import json
import secrets
import time

import pytest

from client import DOMAIN
from door import local_password
from obstacles import away
from raw_door import connection_from
from test_secrets import Canary, Sampler, where

STEP = 2.0  # seconds that a refusal takes at least
ADMIN = "second"


@pytest.fixture(scope="module")
def second(shared_door):
    """The password of one more administrator."""
    password = Canary()
    machine = shared_door.appliance
    machine.must("useradd", "--no-create-home", "--groups", "administrators", ADMIN)
    machine.must("chpasswd", "--crypt-method", "SHA512", input=f"{ADMIN}:{password.text}\n")
    return password


@pytest.fixture(autouse=True)
def forgiven(shared_door):
    """Failures of the test before are forgotten by a server that is started anew."""
    yield
    shared_door.appliance.stop()
    shared_door.appliance.start()


def attempt(door, source, user, password, **headers):
    """A log-in from one of this machine's own addresses."""
    connection = connection_from(door, source)
    try:
        return door.request("POST", "/session/login", {"user": user, "password": password}, headers or None,
                            connection=connection)
    finally:
        connection.close()


def together(door, attempts):
    with concurrent.futures.ThreadPoolExecutor(len(attempts)) as pool:
        return list(pool.map(lambda words: attempt(door, *words), attempts))


def test_every_refusal_is_the_same(shared_door):
    """Whether the user is wrong, the password, or the person no administrator: neither words nor time tell."""
    machine = shared_door.appliance
    for name, password, change in (("expired", "Expired.1", ["chage", "-E", "0"]),
                                   ("locked", "L0cked.1", ["usermod", "-L"])):
        machine.must("useradd", "--no-create-home", "--groups", "administrators", name)
        machine.must("chpasswd", input=f"{name}:{password}\n")
        machine.must(*change, name)
    attempts = [("127.0.0.31", "admin", "wrong"), ("127.0.0.32", "guest", local_password("guest")),
                ("127.0.0.33", "nobody-there", "wrong"), ("127.0.0.34", "expired", "Expired.1"),
                ("127.0.0.35", "locked", "L0cked.1"), ("127.0.0.36", "vorn-httpd", ""),
                ("127.0.0.37", "admin", ""), ("127.0.0.38", "-h", "x"), ("127.0.0.39", "", ""),
                ("127.0.0.40", "a" * 3000, "x"), ("127.0.0.41", "admin", "x" * 20000), ("127.0.0.42", "ad\0min", "x"),
                ("127.0.0.43", "root", "wrong"), ("127.0.0.44", "admin\nroot", "x")]
    replies = []
    for place in range(0, len(attempts), 2):
        replies += together(shared_door, attempts[place:place + 2])
    for words, reply in zip(attempts, replies):
        assert (reply.status, reply.body) == (401, replies[0].body), words
        assert reply.code == 222 and reply.cookies == [], words
        assert STEP <= reply.seconds < 3 * STEP, (words, reply.seconds)
    assert all(line.count("\n") == 0 for line in machine.syslog().splitlines())
    log = machine.syslog()
    for name in ("admin", "guest", "nobody-there", "expired", "locked"):
        assert f"log-in of {name} from 127.0.0." in log, name
    assert "aaaaaaaa" not in log and "vorn-httpd: root" not in log


def test_wrong_parameters(shared_door):
    for body in ({}, {"user": "admin"}, {"password": "x"}, {"user": 1, "password": "x"},
                 {"user": "admin", "password": None}, {"user": ["admin"], "password": "x"}):
        reply = shared_door.request("POST", "/session/login", body)
        assert (reply.status, reply.code) == (400, 206), body
    for body in ({}, {"token": 1}, {"token": None}):
        assert shared_door.request("POST", "/session/link", body).code == 206, body


def test_guessing_the_password_of_a_user(shared_door, second):
    """From many addresses: the user has to wait, and so has the right password; nobody else does."""
    inside = shared_door.login()
    replies = together(shared_door, [(f"127.0.0.{place}", "admin", f"guess{place}") for place in range(50, 55)])
    assert [(reply.status, reply.code) for reply in replies] == [(401, 222)] * 5
    for user in ("admin", "ADMIN"):
        reply = attempt(shared_door, "127.0.0.60", user, local_password("admin"))
        assert (reply.status, reply.code) == (429, 223), user
        assert 1 <= int(reply.headers["Retry-After"]) <= 30 and reply.cookies == []
        assert reply.seconds < STEP, "the password was looked at"
    assert attempt(shared_door, "127.0.0.60", ADMIN, second.text).status == 200
    assert inside.session().status == 200 and inside.call(DOMAIN, 1, "get").ok
    assert shared_door.visitor().login_with(shared_door.new_link()).status == 200


def test_guessing_from_an_address(shared_door, second):
    """Of many users: the address has to wait, whatever it says of itself; from others it is as before."""
    replies = together(shared_door, [("127.0.0.61", f"user{place}", "guess") for place in range(5)])
    assert [(reply.status, reply.code) for reply in replies] == [(401, 222)] * 5
    for headers in ({}, {"X-Forwarded-For": "127.0.0.62"}, {"Forwarded": "for=127.0.0.62"}, {"X-Real-IP": "127.0.0.62"},
                    {"Vorn-Client": "127.0.0.62"}):
        reply = attempt(shared_door, "127.0.0.61", ADMIN, second.text, **headers)
        assert (reply.status, reply.code) == (429, 223), headers
    assert attempt(shared_door, "127.0.0.62", ADMIN, second.text).status == 200


def test_many_guesses_at_once_are_no_more_than_one_after_the_other(shared_door):
    """Of forty at most five are looked at, and whoever is refused learns it at once or after the check."""
    replies = together(shared_door, [(f"127.0.1.{place}", "admin", f"guess{place}") for place in range(40)])
    statuses = [reply.status for reply in replies]
    assert set(statuses) <= {401, 429} and statuses.count(401) <= 5, statuses
    assert all("Retry-After" in reply.headers for reply in replies if reply.status == 429)


def test_a_success_forgives_the_user(shared_door):
    for round_ in range(2):
        replies = together(shared_door, [(f"127.0.2.{round_ * 8 + place}", "admin", "wrong") for place in range(4)])
        assert [reply.status for reply in replies] == [401] * 4
        assert attempt(shared_door, f"127.0.2.{round_ * 8 + 7}", "admin", local_password("admin")).status == 200


def test_a_check_that_fails_counts_for_nothing(shared_door):
    with away(shared_door.appliance, "/usr/vorn/sbin/vornauth"):
        for _ in range(6):
            reply = attempt(shared_door, "127.0.0.70", "admin", local_password("admin"))
            assert (reply.status, reply.code) == (503, 225) and reply.cookies == []
    assert attempt(shared_door, "127.0.0.70", "admin", local_password("admin")).status == 200


# Links.

def test_a_link_logs_in_once(shared_door):
    token = shared_door.new_link()
    first, then = shared_door.visitor(), shared_door.visitor()
    reply = first.login_with(token)
    assert reply.status == 200 and reply.json["data"]["user"] == "root" and first.session().status == 200
    for wrong in (token, token[:-1], token + "x", secrets.token_urlsafe(32), "", "x" * 5000, "ä"):
        reply = then.login_with(wrong)
        assert (reply.status, reply.code) == (401, 224) and reply.cookies == [], wrong
    # Two at the same moment.
    token = shared_door.new_link()
    with concurrent.futures.ThreadPoolExecutor(8) as pool:
        statuses = list(pool.map(lambda _: shared_door.visitor().login_with(token).status, range(8)))
    assert sorted(statuses) == [200] + [401] * 7
    # The page can't make one, nor anybody who is not root.
    for visitor in (first, then):
        assert visitor.request("POST", "/session/new-link", {}).status == 404


def test_a_link_ends_with_the_server(shared_door):
    token = shared_door.new_link()
    shared_door.appliance.kill()
    shared_door.appliance.start()
    assert shared_door.visitor().login_with(token).code == 224


def test_vornctl_makes_links_for_root_alone(shared_door):
    machine = shared_door.appliance
    result = machine.ctl("link")
    assert result.code == 0, result
    token = result.out.split("#/link/")[1].split()[0]
    assert shared_door.visitor().login_with(token).status == 200
    for user in ("vorn-httpd", "nobody", "admin"):
        refused = machine.exec("setpriv", f"--reuid={user}", "--clear-groups", "/usr/vorn/bin/vornctl", "link")
        assert refused.code != 0 and "#/link/" not in refused.out, user


# Secrets.

def test_no_secret_is_left_anywhere(shared_door, second):
    """Passwords right and wrong, cookies, CSRF tokens and links, in any spelling: not in a file, a log or arguments."""
    machine = shared_door.appliance
    begun = time.time() - 1
    wrong = Canary()
    with Sampler(machine) as sampler:
        assert attempt(shared_door, "127.0.0.80", ADMIN, wrong.text).code == 222
        # In the wrong place.
        assert attempt(shared_door, "127.0.0.81", wrong.text, "x").code == 222
        visitor = shared_door.visitor()
        assert visitor.login(ADMIN, second.text).status == 200
        link = shared_door.new_link()
        guest = shared_door.visitor()
        assert guest.login_with(link).status == 200
        spent = shared_door.visitor()
        assert spent.login_with(link).code == 224
        for place in (f"/?token={link}", f"/nothing?password={wrong.middle}&session={visitor.cookie}",
                      f"/session?csrf={visitor.csrf}"):
            visitor.request("GET", place)
        visitor.request("GET", "/", headers={"Referer": f"{shared_door.url}/#/link/{link}",
                                             "User-Agent": visitor.cookie})
        assert visitor.call(DOMAIN, 1, "get").ok
        visitor.request("POST", "/session/logout", headers={"X-CSRF-Token": guest.csrf})
    assert sampler.passes > 5
    sampler.check(wrong.middle, second.middle, visitor.cookie, visitor.csrf, guest.cookie, guest.csrf, link)
    # What the search finds when there is something to be found.
    machine.write("/var/log/canary", f"x{wrong.middle}x")
    assert where(machine, begun, wrong.middle) == ["/var/log/canary"]
    machine.must("rm", "/var/log/canary")
    for secret in (wrong.middle, second.middle, visitor.cookie, guest.cookie, link):
        assert where(machine, begun, secret) == [], secret
    for secret in (visitor.csrf, guest.csrf):
        assert where(machine, begun, secret) == ["/run/vorn/sessions.json"], secret
    stored = json.loads(machine.read("/run/vorn/sessions.json"))["sessions"]
    assert hashlib.sha256(visitor.cookie.encode()).hexdigest() in [session["hash"] for session in stored]
    printed = shared_door.log()
    for secret in (wrong.middle, second.middle, visitor.cookie, visitor.csrf, guest.cookie, guest.csrf, link):
        assert secret not in printed
    visitor.logout()
    guest.logout()
