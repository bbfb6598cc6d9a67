"""A minute of calls through TLS and a session: none fails, and afterwards the door and the server are as before."""

import contextlib
import os
import pathlib
import re
import socket
import ssl
import subprocess
import threading
import time

import pytest

from client import DOMAIN
from door import COOKIE, Door
from processes import Process, processes, programs
from raw_door import GET

SECONDS = int(os.environ.get("VORN_LOAD_SECONDS", "60"))
CONNECTIONS = 32
LARGE = 24 * 2**20
SCRIPT = """
wrk.method = "POST"
wrk.path = "{path}"
wrk.body = "{{}}"
wrk.headers["Content-Type"] = "application/json"
wrk.headers["Origin"] = "{origin}"
wrk.headers["Sec-Fetch-Site"] = "same-origin"
wrk.headers["Cookie"] = "{cookie}"
wrk.headers["X-CSRF-Token"] = "{csrf}"
local threads = {{}}
function setup(thread)
    table.insert(threads, thread)
end
function init(arguments)
    wrong = 0
    first = ""
end
function response(status, headers, body)
    if status ~= 200 or body ~= '{expected}' then
        wrong = wrong + 1
        if first == "" then first = status .. " " .. body end
    end
end
function done(summary, latency, requests)
    local wrong, first = 0, ""
    for _, thread in ipairs(threads) do
        wrong = wrong + thread:get("wrong")
        if first == "" then first = thread:get("first") end
    end
    local errors = summary.errors
    io.write(string.format("RESULT %d %d %d %d %d %d %d\\n", summary.requests, wrong, errors.connect, errors.read,
                           errors.write, errors.timeout, latency:percentile(99)))
    if wrong > 0 then io.write("FIRST " .. first .. "\\n") end
end
"""


class State:
    """What may not grow: descriptors, memory of its own in MB, threads, children."""

    def __init__(self, machine, process):
        self.process = process
        folder = pathlib.Path(process.folder)
        self.descriptors = len(os.listdir(folder / "fd"))
        text = (folder / "smaps_rollup").read_text()
        # The page's files are mapped, too: they are the system's.
        self.memory = int(re.search(r"^Anonymous: +(\d+) kB$", text, re.M)[1]) / 1024
        self.threads = int(process.status("Threads")[0])
        self.children = [each.program for each in processes(machine) if each.parent == process.pid]

    def __repr__(self):
        return f"{self.process.name}: {self.descriptors} descriptors, {self.memory:.1f} MB, {self.threads} threads, " \
               f"{self.children}"


@pytest.fixture
def page(appliance):
    machine = appliance
    machine.must("sh", "-c", f"mkdir -p /srv/page && echo page >/srv/page/index.html && "
                             f"head -c {LARGE} /dev/urandom >/srv/page/large.bin && chmod -R a+rX /srv/page")
    return "/srv/page"


def watch_idle(door, seen):
    """A connection that was used and then is not."""
    with door.connect() as connection:
        connection.sendall(b"GET / HTTP/1.1\r\nHost: x\r\n\r\n")
        connection.settimeout(5)
        connection.recv(4096)
        begin = time.monotonic()
        connection.settimeout(90)
        with contextlib.suppress(OSError):
            connection.recv(1)
        seen["idle"] = time.monotonic() - begin


def watch_reader(door, seen):
    """A client that takes an answer piece by piece, each in time, and the whole of it never."""
    with socket.socket() as plain:
        plain.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, 4096)
        plain.settimeout(20)
        plain.connect((door.address, door.port))
        with door.tls_context().wrap_socket(plain) as connection:
            connection.sendall(b"GET /large.bin HTTP/1.1\r\nHost: x\r\n\r\n")
            begin = time.monotonic()
            size = 0
            with contextlib.suppress(OSError, ssl.SSLError):
                while time.monotonic() - begin < 90 and (piece := connection.recv(16384)):
                    size += len(piece)
                    # Slow until the time is over; what the kernel holds then is taken at once.
                    if time.monotonic() - begin < 62:
                        time.sleep(0.2)
            seen["reader"] = size


def test_a_minute_of_calls(appliance, page, tmp_path):
    machine = appliance
    door = Door(machine)
    door.start("--page", page)
    try:
        visitor = door.login()
        expected = visitor.request("POST", GET)
        assert expected.status == 200
        script = tmp_path / "get.lua"
        script.write_text(SCRIPT.format(path=GET, origin=door.url, cookie=f"{COOKIE}={visitor.cookie}",
                                        csrf=visitor.csrf, expected=expected.body.decode()), encoding="utf-8")

        def run(seconds):
            result = subprocess.run(["wrk", "--threads", "2", "--connections", str(CONNECTIONS), "--duration",
                                     f"{seconds}s", "--timeout", "5s", "--script", str(script), door.url],
                                    capture_output=True, text=True, timeout=seconds + 30, check=True)
            found = re.search(r"RESULT (\d+) (\d+) (\d+) (\d+) (\d+) (\d+) (\d+)", result.stdout)
            assert found, result.stdout + result.stderr
            return [int(number) for number in found.groups()], result.stdout

        # Memory that is taken once, and kept.
        run(2)
        servers = [Process(str(machine.path("/proc")), door.pid)]
        servers += [process for process in programs(machine, "vornd") if process.parent != servers[0].pid]
        before = [State(machine, process) for process in servers]
        assert [state.process.name for state in before] == ["vorn-httpd", "vornd"]

        seen = {}
        watchers = [threading.Thread(target=watch, args=[door, seen], daemon=True)
                    for watch in (watch_idle, watch_reader)] if SECONDS >= 60 else []
        for watcher in watchers:
            watcher.start()
        (requests, wrong, *errors, slowest), text = run(SECONDS)
        assert wrong == 0 and errors == [0, 0, 0, 0], text
        assert requests > 200 * SECONDS, text
        assert slowest < 1000000, text
        for watcher in watchers:
            watcher.join(60)
        if watchers:
            assert 58 < seen["idle"] < 66
            assert 0 < seen["reader"] < LARGE

        counted = door.appliance.client.request("GET", "/metrics")[1].decode()
        total = re.search(rf'vorn_requests_total{{api="{re.escape(DOMAIN)}",method="get",code="0"}} (\d+)', counted)
        assert int(total[1]) >= requests
        assert visitor.session().status == 200
        time.sleep(2)
        after = [State(machine, process) for process in servers]
        for old, new in zip(before, after):
            assert new.descriptors <= old.descriptors, (old, new)
            assert new.memory < old.memory + 4, (old, new)
            assert new.threads <= old.threads and new.children == old.children, (old, new)
        assert not [process for process in processes(machine) if process.state == "Z"]
    finally:
        door.end()
