"""/healthz and /metrics: true, well formed, without names, and not for everybody; and what the door does while the
appliance's server does not answer."""

import re
import signal
import time

import pytest

from client import DOMAIN
from door import Door
from lab import password
from processes import held, loggers, programs
from prometheus import Figures


def figures(door):
    reply = door.get("/metrics")
    assert reply.status == 200 and reply.headers["Content-Type"].startswith("text/plain; version=0.0.4")
    return Figures(reply.body.decode())


def test_figures_are_well_formed_and_rise(shared_door):
    visitor = shared_door.login()
    first = figures(shared_door)
    for _ in range(5):
        assert visitor.call(DOMAIN, 1, "get").ok
    assert visitor.call("VORN.No.Such", 1, "get").code == 210
    assert visitor.call("VORN.Core.Directory.Domain.Conf", 1, "set", {"enable_sync_time": "x"}).code == 2618
    assert shared_door.get("/nothing").status == 404
    second = figures(shared_door)
    assert first.fell(second) == []

    def rise(name, **labels):
        return second.total(name, **labels) - first.total(name, **labels)

    assert rise("vorn_requests_total", api=DOMAIN, method="get", code="0") == 5
    assert rise("vorn_request_seconds_count", api=DOMAIN, method="get") == 5
    assert rise("vorn_requests_total", code="2618") == 1
    assert rise("vorn_httpd_requests_total", verb="POST", status="2xx") == 6
    assert rise("vorn_httpd_requests_total", verb="GET", status="4xx") == 1
    assert rise("vorn_httpd_request_duration_seconds_count") == 9  # with the one for figures before
    assert rise("vorn_httpd_sent_bytes_total") > 1000 and rise("vorn_httpd_received_bytes_total") > 1000
    assert second.total("vorn_up") == 1 and second.total("vorn_sessions") == 1
    assert second.total("vorn_member") == 0
    wanted = {"vorn_requests_total", "vorn_request_seconds", "vorn_tasks_running", "vorn_member", "vorn_up",
              "vorn_httpd_connections", "vorn_httpd_request_duration_seconds"}
    assert wanted <= set(second.types)
    visitor.logout()
    assert figures(shared_door).total("vorn_sessions") == 0


def curl(lab, host, url, cookie=None):
    """Of a host of the lab: status and content."""
    config = f'url = "{url}"\n' + (f'header = "Cookie: {cookie}"\n' if cookie else "")
    result = lab.exec(host, "curl", "--insecure", "--silent", "--max-time", "10", "--write-out", "\\n%{http_code}",
                      "--config", "-", input=config)
    assert result.code == 0, result
    content, _, status = result.out.rpartition("\n")
    return int(status), content


def test_figures_are_for_this_machine_or_a_session(appliance):
    """Seen from another host of the lab."""
    door = Door(appliance)
    door.start(inside=True)
    try:
        lab, address = appliance.lab, appliance.lab.address("nas1")
        here, there = "https://127.0.0.1:8443", f"https://{address}:8443"
        assert curl(lab, "nas2", f"{there}/healthz") == (200, '{"status":"ok"}')
        status, content = curl(lab, "nas2", f"{there}/metrics")
        assert status == 401 and '"code":220' in content and "vorn_up" not in content
        assert curl(lab, "nas2", f"{there}/metrics", "__Host-vorn=" + "x" * 43)[0] == 401
        assert curl(lab, "nas1", f"{here}/metrics")[0] == 200
        token = door.new_link()
        script = ('curl --insecure --silent --max-time 10 --dump-header - --output /dev/null --header '
                  '"Content-Type: application/json" --data-binary @- "$1"')
        result = lab.exec("nas2", "sh", "-c", script, "log-in", f"{there}/session/link",
                          input=f'{{"token":"{token}"}}')
        cookie = re.search(r"(?i)^set-cookie: (__Host-vorn=[^;]+)", result.out, re.M)[1]
        status, content = curl(lab, "nas2", f"{there}/metrics", cookie)
        assert status == 200
        found = Figures(content)
        assert found.total("vorn_up") == 1
        log = appliance.syslog()
        assert f"root has logged in from {lab.address('nas2')} with a one-time link" in log
    finally:
        door.end()


def test_figures_of_a_member_hold_no_names(joined):
    door = Door(joined)
    door.start()
    try:
        assert joined.client.test_dc() is True
        assert joined.client.refresh().ok
        visitor = door.login()
        assert visitor.call(DOMAIN, 1, "get").ok
        found = figures(door)
        assert found.total("vorn_member") == 1 and found.total("vorn_domain_kind", kind="active_directory") == 1
        assert found.total("vorn_last_test_success") == 1
        assert abs(found.total("vorn_last_test_time_seconds") - time.time()) < 60
        assert 0 <= found.total("vorn_list_age_seconds", kind="user", of="own_domain") < 60
        assert found.total("vorn_list_entries", kind="user") > 5
        for name in ("lab", "lab.test", "nas1", "other.test", "administrator", "admin", "alice", "dc1", "10.77.",
                     "127.0.0.1", password("LAB", "Administrator")):
            assert not re.search(rf"(?<![a-z_]){re.escape(name)}(?![a-z_])", found.text, re.I), name
        assert "OTHER" not in found.text
    finally:
        door.end()


# While the appliance's server does not answer.

@pytest.fixture
def calling(door):
    """A session, and a connection to the server that is open already."""
    visitor = door.login()
    assert visitor.call(DOMAIN, 1, "get").ok
    return visitor


def check_without_server(door, visitor, seconds):
    for method, path, body in (("POST", f"/webapi/{DOMAIN}/1/get", {}), ("GET", "/session", None),
                               ("POST", "/session/login", {"user": "admin", "password": "x"})):
        reply = visitor.request(method, path, body)
        assert (reply.status, reply.code) == (503, 250), path
        assert reply.seconds < seconds, (path, reply.seconds)
        assert reply.cookies == []


def test_the_page_is_served_while_the_server_is_away(door, calling):
    machine = door.appliance
    page = door.get("/")
    machine.stop()
    check_without_server(door, calling, 1)
    again = door.get("/")
    assert (again.status, again.body) == (page.status, page.body) and again.status == 200
    # What was found holds for a second.
    machine.wait_until(lambda: door.get("/healthz").status == 503, 3, "sickness")
    reply = door.get("/healthz")
    assert (reply.status, reply.code) == (503, 250) and reply.seconds < 1
    found = figures(door)
    assert found.total("vorn_up") == 0 and found.total("vorn_httpd_upstream_failures_total") >= 3
    assert not [name for name in found.types if name.startswith("vorn_request")]
    machine.start()
    assert calling.call(DOMAIN, 1, "get").ok and calling.session().status == 200
    machine.wait_until(lambda: door.get("/healthz").status == 200, 3, "health")
    machine.kill()
    check_without_server(door, calling, 1)
    machine.start()
    assert calling.call(DOMAIN, 1, "get").ok


def test_a_logger_that_hangs_keeps_nobody_waiting(door, calling):
    machine = door.appliance
    with held(lambda: loggers(machine)) as hanging:
        assert len(hanging) == 1
        # More lines than the system keeps for it.
        for _ in range(100):
            assert door.get("/nothing", deadline=5).status == 404
        visitor = door.visitor()
        assert visitor.login_with(door.new_link()).status == 200
        assert visitor.logout().status == 200
        assert calling.call(DOMAIN, 1, "get", deadline=5).ok
        assert figures(door).total("vorn_httpd_log_lines_lost_total") > 0
    machine.wait_until(lambda: calling.call(DOMAIN, 1, "get").ok, 10, "calls")


def test_a_server_that_hangs_is_told_within_two_seconds(door, calling):
    machine = door.appliance
    servers = programs(machine, "vornd")
    assert door.get("/healthz").status == 200
    time.sleep(1.1)  # what was found holds for a second
    for process in servers:
        process.signal(signal.SIGSTOP)
    try:
        reply = door.get("/healthz", deadline=10)
        assert (reply.status, reply.code) == (503, 250) and 1.5 < reply.seconds < 5
        assert door.get("/").status == 200
        begin = time.monotonic()
        assert figures(door).total("vorn_up") == 0
        assert time.monotonic() - begin < 5
    finally:
        for process in servers:
            process.signal(signal.SIGCONT)
    machine.wait_until(lambda: door.get("/healthz").status == 200, 5, "health")
    assert calling.call(DOMAIN, 1, "get").ok
