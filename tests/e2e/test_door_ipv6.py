"""The door over IPv6: log-in and calls, whose address is told, and how far the throttle reaches."""

import concurrent.futures
import json

import pytest

from appliance import Appliance
from client import DOMAIN
from door import COOKIE, Door, local_password

PORT = 8443
NETWORK = "2001:db8:a::{}"
ELSEWHERE = "2001:db8:b::1"
SERVER = NETWORK.format("ff")
ORIGIN = f"https://[{SERVER}]:{PORT}"


class Reply:
    def __init__(self, printed):
        head, _, self.body = printed.partition("\r\n\r\n")
        lines = head.split("\r\n")
        self.status = int(lines[0].split()[1])
        self.headers = {name.lower(): value.strip() for name, _, value in (line.partition(":") for line in lines[1:])}

    @property
    def code(self):
        return json.loads(self.body).get("error", {}).get("code")

    @property
    def data(self):
        return json.loads(self.body)["data"]


class Guest:
    """A client on the appliance itself, with one of its addresses, told by curl."""

    def __init__(self, machine, source, origin=ORIGIN):
        self.machine = machine
        self.source = source
        self.origin = origin

    def request(self, path, body=None, **headers):
        words = ["curl", "--http1.1", "--insecure", "--silent", "--show-error", "--globoff", "--noproxy", "*",
                 "--include", "--max-time", "20", "--interface", self.source, self.origin + path]
        if body is not None:
            words += ["--data-binary", "@-", "-H", "Content-Type: application/json"]
            headers = {"Origin": self.origin, **headers}
        for name, value in headers.items():
            words += ["-H", f"{name.replace('_', '-')}: {value}"]
        return Reply(self.machine.must(*words, input=None if body is None else json.dumps(body)).out)

    def log_in(self, password, user="admin"):
        return self.request("/session/login", {"user": user, "password": password})


@pytest.fixture(scope="module")
def machine(lab):
    found = Appliance(lab, "nas1")
    found.renew()
    # Without a look for others that have the address: until that is over nobody can take it.
    found.must("sh", "-c", 'echo 0 >/proc/sys/net/ipv6/conf/all/disable_ipv6 && echo 0 >/proc/sys/net/ipv6/conf/lo/'
                           'disable_ipv6 && ip addr replace ::1/128 dev lo && '
                           'for address; do ip addr add "$address/64" dev lo nodad; done',
               "addresses", SERVER, ELSEWHERE, *(NETWORK.format(at) for at in range(1, 8)))
    door = Door(found)
    door.start(listen=[f"[::]:{PORT}", f"0.0.0.0:{PORT}"], inside=True)
    yield found
    door.end()
    lab.must("renew", "nas1")


def test_log_in_and_call(machine):
    guest = Guest(machine, NETWORK.format(1))
    entered = guest.log_in(local_password("admin"))
    assert entered.status == 200
    cookie = entered.headers["set-cookie"].split(";")[0]
    assert cookie.startswith(f"{COOKIE}=")
    token = {"Cookie": cookie, "X_CSRF_Token": entered.data["csrf"]}
    assert guest.request(f"/webapi/{DOMAIN}/1/get", {}, **token).data == {"enable_domain": False}
    assert f"admin has logged in from {guest.source}" in machine.syslog()
    # A page of another address of this very machine is another page.
    refused = guest.request(f"/webapi/{DOMAIN}/1/get", {}, **token, Origin=f"https://[{ELSEWHERE}]:{PORT}")
    assert refused.status == 403, refused.body


def test_a_network_of_64_bits_has_to_wait_together(machine):
    with concurrent.futures.ThreadPoolExecutor(5) as pool:
        replies = list(pool.map(lambda at: Guest(machine, NETWORK.format(at)).log_in("guess", f"user{at}"),
                                range(1, 6)))
    assert [(reply.status, reply.code) for reply in replies] == [(401, 222)] * 5
    waiting = Guest(machine, NETWORK.format(6)).log_in(local_password("admin"))
    assert (waiting.status, waiting.code) == (429, 223) and 1 <= int(waiting.headers["retry-after"]) <= 30
    assert Guest(machine, ELSEWHERE).log_in(local_password("admin")).status == 200


@pytest.mark.parametrize("source, origin, status", [
    ("::1", f"https://[::1]:{PORT}", 200),
    ("127.0.0.1", f"https://127.0.0.1:{PORT}", 200),
    (NETWORK.format(7), ORIGIN, 401),
])
def test_figures_are_for_loopback(machine, source, origin, status):
    assert Guest(machine, source, origin).request("/metrics").status == status
