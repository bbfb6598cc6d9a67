"""A client of vornd's unix socket. It talks to the socket of an appliance of the lab from outside of its namespaces.
Every refusal that it gets must have a code that the catalogue has for it."""

import json
import pathlib
import socket
import time

DOMAIN = "VORN.Core.Directory.Domain"
CONF = "VORN.Core.Directory.Domain.Conf"
SCHEDULE = "VORN.Core.Directory.Domain.Schedule"
DIRECTORY = "VORN.Appliance.Directory"
EVENTS = "VORN.Appliance.EventLog"


CATALOGUE = pathlib.Path(__file__).resolve().parents[2] / "appliance" / "catalogue"
DOCUMENTED = {
    (row["api"], row["version"], row["method"]): set(row["codes"])
    for row in json.loads((CATALOGUE / "methods.json").read_text(encoding="utf-8"))
}
SERVER_CODES = {
    entry["code"]
    for entry in json.loads((CATALOGUE / "error-codes.json").read_text(encoding="utf-8"))["codes"]
    if entry["group"] == "server"
}


class Refused(Exception):
    """The appliance answered with an error."""

    def __init__(self, code, errors):
        super().__init__(f"code {code}, errors {errors}")
        self.code = code
        self.errors = errors


class Answer:
    """One answer: HTTP status, the JSON body, and how many seconds it took."""

    def __init__(self, status, body, seconds):
        self.status = status
        self.body = body
        self.seconds = seconds

    @property
    def ok(self):
        return self.body.get("success") is True

    @property
    def data(self):
        if not self.ok:
            raise Refused(self.code, self.body.get("error", {}).get("errors"))
        return self.body.get("data")

    @property
    def code(self):
        return self.body.get("error", {}).get("code")


def check_documented(api, version, method, answer):
    """A module's refusal, which has status 200, has a code of its method; any other has one of the server itself."""
    if answer.ok:
        return
    codes = SERVER_CODES
    if answer.status == 200:
        # The highest version that is not above the one that was asked for.
        versions = [row for row in DOCUMENTED if (row[0], row[2]) == (api, method) and row[1] <= version]
        if not versions:
            return  # a module of a test's own
        codes = DOCUMENTED[max(versions)]
    assert answer.code in codes, f"{api} {version} {method} answers {answer.code}, which methods.json does not list"


class Client:
    """Each call opens a connection of its own, so that one object serves many threads."""

    def __init__(self, path):
        self.path = path

    def request(self, method, target, body=b"", headers=(), deadline=120.0):
        """Sends one request and answers (status, body as bytes)."""
        with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as connection:
            connection.settimeout(deadline)
            connection.connect(self.path)
            head = f"{method} {target} HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\n"
            if body:
                head += f"Content-Type: application/json\r\nContent-Length: {len(body)}\r\n"
            for line in headers:
                head += line + "\r\n"
            connection.sendall(head.encode() + b"\r\n" + body)
            received = bytearray()
            end = time.monotonic() + deadline
            while True:
                if time.monotonic() > end:
                    raise TimeoutError(f"{method} {target} took longer than {deadline} s")
                piece = connection.recv(65536)
                if not piece:
                    break
                received += piece
        head, _, body = bytes(received).partition(b"\r\n\r\n")
        if not head:
            raise ConnectionError(f"{method} {target}: no answer")
        return int(head.split()[1]), body

    def call(self, api, version, method, parameters=None, deadline=120.0):
        """Calls a method of a module; the answer may be a failure."""
        started = time.monotonic()
        status, body = self.request(
            "POST", f"/webapi/{api}/{version}/{method}", json.dumps(parameters or {}).encode(), deadline=deadline
        )
        answer = Answer(status, json.loads(body), time.monotonic() - started)
        check_documented(api, version, method, answer)
        return answer

    # The methods that most tests call.

    def get(self):
        return self.call(DOMAIN, 1, "get").data

    def join(self, domain, user, password, deadline=120.0, **more):
        return self.call(
            DOMAIN,
            1,
            "set",
            {"enable_domain": True, "domain_name": domain, "username": user, "password": password, **more},
            deadline=deadline,
        )

    def leave(self, **more):
        return self.call(DOMAIN, 1, "set", {"enable_domain": False, **more})

    def test_dc(self):
        return self.call(DOMAIN, 1, "test_dc").data["test_join_success"]

    def domains(self, version=1):
        return self.call(DOMAIN, version, "get_domain_list").data["domain_list"]

    def start_refresh(self, domain=None):
        return self.call(DOMAIN, 1, "update_start", {} if domain is None else {"domain_name": domain})

    def refresh_status(self, task):
        return self.call(DOMAIN, 1, "update_status", {"task_id": task})

    def refresh(self, domain=None, deadline=120.0):
        """Refreshes and waits for the end; answers the last status."""
        task = self.start_refresh(domain).data["task_id"]
        end = time.monotonic() + deadline
        while True:
            answer = self.refresh_status(task)
            if not answer.ok or answer.data["status"] == "finish":
                return answer
            if time.monotonic() > end:
                raise TimeoutError(f"the refresh did not end within {deadline} s")
            time.sleep(0.1)

    def options(self, **changes):
        if changes:
            return self.call(CONF, 1, "set", changes).data
        return self.call(CONF, 1, "get").data

    def schedule(self, **values):
        if values:
            return self.call(SCHEDULE, 1, "set", values).data
        return self.call(SCHEDULE, 1, "get").data
