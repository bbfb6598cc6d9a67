"""What could be done by whoever takes over the door: with its account alone, next to nothing."""

import contextlib
import json
import os
import re
import secrets
import subprocess
import time

import pytest

from client import DOMAIN
from lab import COMMAND, PROJECT
from processes import Process, programs
from prometheus import Figures, figures_of

AS = "setpriv --reuid={0} --regid={1} --clear-groups --no-new-privs --inh-caps=-all --bounding-set=-all --"
# Asks the appliance's server; reads requests as JSON, prints [status, code, content] of each.
ASK = """
import http.client, json, socket, sys
class Local(http.client.HTTPConnection):
    def connect(self):
        self.sock = socket.socket(socket.AF_UNIX)
        self.sock.settimeout(20)
        self.sock.connect("/run/vorn/vornd.sock")
answers = []
for verb, target, headers, body in json.load(sys.stdin):
    connection = Local("localhost")
    try:
        connection.request(verb, target, body, headers)
        reply = connection.getresponse()
        content = reply.read().decode(errors="replace")
        try:
            code = json.loads(content)["error"]["code"]
        except Exception:
            code = None
        answers.append([reply.status, code, content[:20000]])
    except (OSError, http.client.HTTPException) as error:
        answers.append([0, None, repr(error)])
    connection.close()
json.dump(answers, sys.stdout)
"""
# Opens so many connections and holds them.
HOLD = """
import socket, sys, time
held = []
for _ in range(int(sys.argv[1])):
    connection = socket.socket(socket.AF_UNIX)
    connection.settimeout(5)
    connection.connect("/run/vorn/vornd.sock")
    if sys.argv[2] == "drip":
        connection.sendall(b"GET /session HTTP/1.1\\r\\nX: ")
    held.append(connection)
print("held", flush=True)
time.sleep(60)
"""
JSON = {"Content-Type": "application/json"}
READ = {
    "/etc/shadow", "/usr/vorn/etc/private", "/var/lib/vorn", "/run/vorn/sessions.json", "/var/lib/samba/private",
    "/run/vorn/join_steps.json", "/etc/krb5.keytab", "/root", "/var/lib/vorn/tasks.db",
}


def as_user(user, *words):
    return (*AS.format(user, "nogroup" if user in ("admin", "nobody") else user).split(), *words)


def ask(machine, user, requests):
    result = machine.must(*as_user(user, "python3", "-c", ASK), input=json.dumps(requests), deadline=60)
    answers = json.loads(result.out)
    assert len(answers) == len(requests)
    return answers


def methods():
    catalogue = json.loads((PROJECT / "appliance/catalogue/methods.json").read_text(encoding="utf-8"))
    return [f"/webapi/{entry['api']}/{entry['version']}/{entry['method']}" for entry in catalogue]


def everything(session=None):
    """Whatever can be asked for."""
    headers = {**JSON, **({"Vorn-Session": session, "Vorn-Csrf": session} if session else {})}
    requests = [["POST", target, headers, "{}"] for target in methods()]
    requests += [["GET", target, headers, None] for target in (
        "/webapi", "/webapi/openapi.json", "/session", "/", "/healthz", "/tasks", "/run/vorn/sessions.json",
        "/../etc/shadow", "/metrics/../webapi", "/webapi?x", "//webapi", "/webapi/", "/session/")]
    requests += [["POST", target, headers, "{}"] for target in (
        "/session/new-link", "/session/logout", "/session", "/metrics", "/webapi", "/", "/session/new-link/")]
    requests += [[verb, target, headers, None] for verb in ("PUT", "DELETE", "OPTIONS", "TRACE", "HEAD", "PATCH")
                 for target in ("/webapi", "/session", "/session/new-link", "/")]
    return requests


@pytest.mark.parametrize("user", ["vorn-httpd", "nobody", "admin"])
def test_an_account_opens_nothing_without_a_session(shared_door, user):
    machine = shared_door.appliance
    before = figures_of(machine).total("vorn_request_seconds_count", api=DOMAIN)
    for session in (None, secrets.token_urlsafe(32)):
        requests = everything(session)
        for request, answer in zip(requests, ask(machine, user, requests)):
            path = tuple(request[:2])
            assert answer[0] in (401, 405) and (answer[0] == 401 or path[1].startswith(("/session", "/metrics"))), (
                path, answer)
            assert answer[1] in (205, 214, 220) or path[0] == "HEAD", (path, answer)
    assert figures_of(machine).total("vorn_request_seconds_count", api=DOMAIN) == before


def test_root_alone_opens_everything(shared_door):
    """What the test above relies on: the same requests are answered to somebody."""
    requests = [["POST", f"/webapi/{DOMAIN}/1/get", JSON, "{}"], ["POST", "/session/new-link", JSON, "{}"],
                ["GET", "/webapi", {}, None]]
    answers = ask(shared_door.appliance, "root", requests)
    assert [answer[0] for answer in answers] == [200, 200, 200]


def test_the_door_logs_in_and_others_do_not(shared_door):
    machine = shared_door.appliance
    for user, allowed in (("vorn-httpd", True), ("nobody", False)):
        token = shared_door.new_link()
        answer = ask(machine, user, [["POST", "/session/link", JSON, json.dumps({"token": token})]])[0]
        assert answer[0] == (200 if allowed else 401), answer
        if allowed:
            data = json.loads(answer[2])["data"]
            headers = {**JSON, "Vorn-Session": data["session"], "Vorn-Csrf": data["csrf"]}
            answers = ask(machine, user, [["POST", f"/webapi/{DOMAIN}/1/get", headers, "{}"],
                                          ["POST", f"/webapi/{DOMAIN}/1/get", {**headers, "Vorn-Csrf": "x"}, "{}"],
                                          ["POST", "/session/new-link", headers, "{}"],
                                          ["POST", "/session/logout", headers, "{}"]])
            assert [answer[:2] for answer in answers] == [[200, None], [403, 221], [401, 205], [200, None]]
            # Another account with the door's session is still nobody.
            stolen = shared_door.login()
            headers = {**JSON, "Vorn-Session": stolen.cookie, "Vorn-Csrf": stolen.csrf}
            answer = ask(machine, "nobody", [["POST", f"/webapi/{DOMAIN}/1/get", headers, "{}"]])[0]
            assert answer[:2] == [401, 205]
            stolen.logout()


def test_marks_that_are_there_twice_are_refused(shared_door):
    visitor = shared_door.login()
    script = f"""
import socket
c = socket.socket(socket.AF_UNIX); c.settimeout(10); c.connect("/run/vorn/vornd.sock")
c.sendall(b"GET /session HTTP/1.1\\r\\nHost: x\\r\\n")
c.sendall(b"Vorn-Session: {"x" * 43}\\r\\nvorn-session: {visitor.cookie}\\r\\n\\r\\n")
print(c.recv(4096).decode())
"""
    result = shared_door.appliance.must(*as_user("vorn-httpd", "python3", "-c", script))
    assert result.out.startswith("HTTP/1.1 400 "), result
    visitor.logout()


def test_figures_hold_no_names(shared_door):
    for user in ("vorn-httpd", "nobody"):
        answer = ask(shared_door.appliance, user, [["GET", "/metrics", {}, None]])[0]
        assert answer[0] == 200
        Figures(answer[2])
        assert not re.search(r"nas1|admin\b|lab\.test|127\.0\.0\.1", answer[2], re.I), answer[2]


@pytest.mark.parametrize("way", ["idle", "drip"])
def test_an_account_that_takes_all_connections_keeps_root_out_of_none(shared_door, way):
    machine = shared_door.appliance
    words = [str(COMMAND), "exec", machine.host, *as_user("vorn-httpd", "python3", "-c", HOLD, "240", way)]
    holder = subprocess.Popen(words, stdin=subprocess.DEVNULL, stdout=subprocess.PIPE, stderr=subprocess.PIPE,
                              env={**os.environ, **machine.lab.env}, start_new_session=True)
    try:
        assert holder.stdout.readline() == b"held\n" or holder.wait(20) is not None
        for _ in range(5):
            begin = time.monotonic()
            assert machine.client.call(DOMAIN, 1, "get", deadline=10).ok
            assert time.monotonic() - begin < 4
        assert figures_of(machine).total("vorn_connections") <= 200
    finally:
        for process in programs(machine, "python3.11", "python3"):
            if b"vornd.sock" in process.read("cmdline"):
                process.signal(9)
        holder.wait(20)
        holder.stdout.close()
        holder.stderr.close()
    assert shared_door.login().logout().status == 200


def test_it_is_a_process_without_rights(shared_door):
    machine = shared_door.appliance
    process = Process(str(machine.path("/proc")), shared_door.pid)
    user = machine.must("id", "-u", "vorn-httpd").out.strip()
    assert process.status("Uid") == [user] * 4 and process.status("Groups") == []
    assert process.status("NoNewPrivs") == ["1"]
    for kind in ("CapInh", "CapPrm", "CapEff", "CapBnd", "CapAmb"):
        assert int(process.status(kind)[0], 16) == 0, kind
    assert process.arguments[0] == "/usr/vorn/sbin/vorn-httpd"
    # It may not be traced or dumped, not even by another process of its account.
    assert os.stat(f"{process.folder}/environ").st_uid == 0
    refused = machine.exec(*as_user("vorn-httpd", "cat", f"/proc/{shared_door.pid}/environ"))
    assert refused.code != 0 and refused.out == ""


def test_it_holds_nothing_open_but_its_own(shared_door):
    machine = shared_door.appliance
    visitor = shared_door.login()
    assert visitor.call(DOMAIN, 1, "get").ok and shared_door.get("/").status in (200, 404)
    process = machine.path("/proc") / str(shared_door.pid)
    targets = {}
    for name in os.listdir(process / "fd"):
        # A connection may come to its end meanwhile.
        with contextlib.suppress(FileNotFoundError):
            targets[name] = os.readlink(process / "fd" / name)
    assert any(target.startswith("socket:") for target in targets.values()), targets
    for name, target in targets.items():
        own = re.match(r"socket:|anon_inode:\[(eventpoll|eventfd|timerfd|signalfd)\]|pipe:|/dev/null", target)
        # The first three are the business of whoever starts it.
        assert own or int(name) < 3, (name, target)
    visitor.logout()
    mapped = (process / "maps").read_text()
    files = {line.split(maxsplit=5)[5] for line in mapped.splitlines() if len(line.split(maxsplit=5)) > 5}
    for path in files:
        assert re.match(r"\[|/usr/vorn/sbin/vorn-httpd|/usr/vorn/share/console/|/(usr/)?lib/.*\.so", path), path
    assert not [line for line in mapped.splitlines() if line.split()[1].startswith("rwx")]


def test_the_account_reads_and_writes_nothing_of_the_appliance(shared_door):
    machine = shared_door.appliance
    visitor = shared_door.login()
    machine.must("sh", "-c", "mkdir -p /usr/vorn/etc/private && touch /usr/vorn/etc/private/probe")
    there = [path for path in READ if machine.exists(path)]
    assert {"/etc/shadow", "/usr/vorn/etc/private", "/var/lib/vorn", "/run/vorn/sessions.json"} <= set(there)
    for path in there:
        result = machine.exec(*as_user("vorn-httpd", "sh", "-c", 'ls "$1"/ || cat "$1"', "read", path))
        assert result.code != 0 and result.out == "", path
    found = machine.exec(*as_user("vorn-httpd", "find", "/usr/vorn", "/run/vorn", "/etc", "/var/lib", "/var/log",
                                  "-writable", "-not", "-type", "l"), deadline=60)
    writable = set(found.out.splitlines())
    assert all(path.startswith("/var/lib/vorn-httpd") or path == "/run/vorn/vornd.sock" for path in writable), writable
    for name in ("vornd", "vornjoin", "vornwin", "vornauth"):
        result = machine.exec(*as_user("vorn-httpd", f"/usr/vorn/sbin/{name}"), deadline=10, input="admin\0x\0")
        assert result.code != 0, name
    visitor.logout()
    # Nor does it stop anything.
    for process in programs(machine, "vornd"):
        assert machine.exec(*as_user("vorn-httpd", "kill", "-9", str(process.pid))).code != 0
