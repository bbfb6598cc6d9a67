"""The lab's door to the machine: who runs it, where it is to be reached, and that it goes with its lab."""

import contextlib
import os
import re
import signal
import socket
import ssl
import time

import pytest

from door import local_password
from lab import Lab, run

BARE = ("--no-ad", "--appliances", "nas7,nas8")


@pytest.fixture(scope="module")
def stage(pytestconfig):
    folder = pytestconfig.getoption("--stage")
    assert folder, "--stage names the tree with the program"
    return folder


@pytest.fixture
def make(tmp_path, stage):
    made = []

    def make_one(name):
        made.append(Lab(tmp_path / name))
        made[-1].up(*BARE, "--stage", stage)
        return made[-1]

    yield make_one
    for lab in made:
        lab.down()


def status_of(lab, host):
    """/proc/PID/status of the door, as the host sees it."""
    pid = (lab.folder / "hosts" / host / "httpd").read_text().split()[0]
    text = lab.exec(host, "cat", f"/proc/{pid}/status").out
    return dict(line.split(":\t", 1) for line in text.splitlines())


def start(lab, host, *words):
    result = lab.must("httpd", host, "start", *words)
    return re.search(r"(https?)://([0-9.]+):(\d+)/", result.out).groups()


def reachable(port, address="127.0.0.1"):
    with contextlib.suppress(OSError), socket.create_connection((address, port), timeout=2):
        return True
    return False


def own_port():
    """A free port that no lab takes by itself: those from 8443 on, once free, may be another lab's at once."""
    with socket.socket() as free:
        free.bind(("127.0.0.1", 0))
        return free.getsockname()[1]


def shown_at(port):
    """The certificate of the one who is there, which tells this lab's door from another's; None when nobody is."""
    with contextlib.suppress(OSError):
        return ssl.get_server_certificate(("127.0.0.1", port), timeout=5).strip()
    return None


def gone(port, served=reachable, seconds=5):
    end = time.monotonic() + seconds
    while served(port):
        assert time.monotonic() < end, f"port {port} is still served"
        time.sleep(0.05)


def test_it_runs_without_any_privilege(make):
    lab = make("a")
    start(lab, "nas7")
    status = status_of(lab, "nas7")
    user = int(lab.exec("nas7", "id", "-u", "vorn-httpd").out)
    group = int(lab.exec("nas7", "id", "-g", "vorn-httpd").out)
    assert 0 < user < 1000 and status["Name"].strip() == "vorn-httpd"
    assert status["Uid"].split() == [str(user)] * 4 and status["Gid"].split() == [str(group)] * 4
    assert status["Groups"].split() == [] and status["NoNewPrivs"].strip() == "1"
    for kind in ("CapInh", "CapPrm", "CapEff", "CapBnd", "CapAmb"):
        assert int(status[kind], 16) == 0, kind
    state = lab.exec("nas7", "stat", "-c", "%U %G %a", "/var/lib/vorn-httpd")
    assert state.out == "vorn-httpd vorn-httpd 700\n", state


def test_the_accounts_of_an_appliance(make):
    lab = make("a")
    users = lab.must("users").out
    for name, member in (("admin", True), ("guest", False)):
        assert re.search(rf"^\(nas\) +{name} +{re.escape(local_password(name))} ", users, re.M), users
        assert ("administrators" in lab.exec("nas7", "id", "-nG", name).out.split()) is member
        crypted = lab.exec("nas7", "getent", "shadow", name).out.split(":")[1]
        salt = crypted.rsplit("$", 1)[0]
        again = lab.exec("nas7", "openssl", "passwd", "-6", "-salt", salt.split("$")[2], "-stdin",
                         input=local_password(name))
        assert again.out.strip() == crypted
    assert lab.exec("nas7", "getent", "passwd", "vorn-httpd").out.split(":")[6] == "/usr/sbin/nologin\n"
    with open("/etc/passwd", encoding="utf-8") as machine:
        assert not re.search("^(admin|guest):", machine.read(), re.M)


def test_browsers_of_the_machine_reach_it(make):
    lab = make("a")
    scheme, address, port = start(lab, "nas7")
    assert (scheme, address) == ("https", "127.0.0.1") and int(port) >= 8443
    # Another one takes another port.
    assert start(lab, "nas8")[2] != port
    assert run(["curl", "-sk", "--max-time", "5", f"https://127.0.0.1:{port}/healthz"], 10).code == 0
    assert f"vorn-httpd at https://127.0.0.1:{port}/" in lab.must("status").out
    assert lab.must("httpd", "nas7", "status").out == (
        f"ok: vorn-httpd is running in nas7: https://127.0.0.1:{port}/\n")
    twice = lab.command("httpd", "nas7", "start")
    assert twice.code == 1 and "vorn-httpd is running in nas7" in twice.err and len(twice.err.splitlines()) == 1
    own = shown_at(int(port))
    assert own
    lab.must("httpd", "nas7", "stop")
    gone(int(port), lambda port: shown_at(port) == own)
    assert lab.command("httpd", "nas7", "status").code == 1
    assert lab.command("httpd", "nas7", "stop").err == "lab: vorn-httpd is not running in nas7\n"
    lab.must("httpd", "nas8", "kill")
    # The first that is free, which another lab's door may have taken meanwhile, or left below.
    again = int(start(lab, "nas8")[2])
    assert 8443 <= again <= int(port) or reachable(int(port)), (again, port)


def test_it_listens_where_it_is_told(make):
    lab = make("a")
    with socket.socket() as taken:
        taken.bind(("127.0.0.1", 0))
        taken.listen()
        busy = taken.getsockname()[1]
        refused = lab.command("httpd", "nas7", "start", "--listen", f"127.0.0.1:{busy}")
    assert refused.code == 1 and "can't have its address" in refused.err, refused
    assert lab.command("httpd", "nas7", "status").code == 1
    assert start(lab, "nas7", "--listen", f"127.0.0.1:{busy}") == ("https", "127.0.0.1", str(busy))
    lab.must("httpd", "nas7", "stop")
    assert start(lab, "nas7", "--listen", f"127.0.0.1:{busy}", "--", "--clear-text")[0] == "http"
    assert run(["curl", "-s", "--max-time", "5", f"http://127.0.0.1:{busy}/healthz"], 10).code == 0


def test_inside_it_is_out_of_reach_of_the_machine(make):
    lab = make("a")
    _, address, port = start(lab, "nas7", "--inside")
    assert (address, port) == ("127.0.0.1", "8443")
    own = lab.exec("nas7", "cat", "/var/lib/vorn-httpd/certificate.pem").out.strip()
    assert own.startswith("-----BEGIN CERTIFICATE-----") and shown_at(8443) != own
    for host, target in (("nas7", "127.0.0.1"), ("nas8", lab.address("nas7"))):
        assert lab.exec(host, "curl", "-sk", "--max-time", "5", f"https://{target}:8443/healthz").code == 0, host


@pytest.mark.parametrize("end", ["down", "holder", "init", "renew"])
def test_it_goes_with_its_host(make, end):
    lab = make("a")
    port = own_port()
    start(lab, "nas7", "--listen", f"127.0.0.1:{port}")
    assert reachable(port)
    if end == "down":
        lab.down()
    elif end == "renew":
        lab.must("renew", "nas7")
        assert lab.command("httpd", "nas7", "status").code == 1
    else:
        os.kill(int((lab.folder / "hosts" / "nas7" / end).read_text().split()[0]), signal.SIGKILL)
    gone(port)
    lab.down()


def test_a_stopped_one_does_not_keep_a_lab(make):
    lab = make("a")
    port = own_port()
    start(lab, "nas7", "--listen", f"127.0.0.1:{port}")
    assert reachable(port)
    lab.exec("nas7", "kill", "-STOP", (lab.folder / "hosts" / "nas7" / "httpd").read_text().split()[0])
    assert lab.down().seconds < 10
    gone(port)


def test_the_fixture_logs_in_and_calls(door):
    assert door.get("/healthz").json == {"status": "ok"}
    stranger = door.visitor()
    assert stranger.session().status == 401
    assert stranger.login("admin", "wrong").code == 222
    assert stranger.login("guest").code == 222
    visitor = door.login()
    assert visitor.session().json["data"]["user"] == "admin"
    answer = visitor.call("VORN.Core.Directory.Domain", 1, "get")
    assert answer.data == {"enable_domain": False}
    guest = door.visitor()
    assert guest.login_with(door.new_link()).status == 200
    assert guest.call("VORN.Appliance.Directory", 1, "overview", background=True).data["host_name"] == "NAS1"
    assert guest.logout().status == 200 and guest.cookie is None
    assert guest.session().status == 401
    assert visitor.session().status == 200
