"""The door of an appliance, vorn-httpd, as a browser sees it: TLS, cookies, CSRF tokens, log-in."""

import contextlib
import http.client
import json
import re
import socket
import ssl
import time
import urllib.parse

from client import Answer
from lab import ACCOUNTS

COOKIE = "__Host-vorn"


def local_password(name):
    """The password of an appliance's own account, such as "admin" or "guest"."""
    for line in ACCOUNTS.read_text(encoding="utf-8").splitlines():
        fields = [field.strip() for field in line.split("|")]
        if fields[:2] == ["local", name]:
            return fields[2]
    raise KeyError(name)


class Reply:
    """One HTTP answer. HEADERS is a http.client.HTTPMessage: any case, get_all() for repeated ones."""

    def __init__(self, status, headers, body, seconds):
        self.status = status
        self.headers = headers
        self.body = body
        self.seconds = seconds

    @property
    def json(self):
        return json.loads(self.body)

    @property
    def code(self):
        """The error code of a refusal; None for a success."""
        return self.json.get("error", {}).get("code")

    @property
    def answer(self):
        return Answer(self.status, self.json, self.seconds)

    @property
    def cookies(self):
        """The Set-Cookie headers as they came."""
        return self.headers.get_all("Set-Cookie") or []

    def __repr__(self):
        return f"{self.status}\n{self.headers}\n{self.body[:2000]!r}"


class Door:
    """vorn-httpd of one appliance. Where it listens is known once it is started."""

    def __init__(self, appliance):
        self.appliance = appliance
        self.lab = appliance.lab
        self.url = None

    # The program.

    def start(self, *options, listen=(), inside=False):
        """OPTIONS are the program's own. Answers what the lab printed."""
        words = ["--inside"] if inside else []
        for address in listen:
            words += ["--listen", address]
        result = self.lab.must("httpd", self.appliance.host, "start", *words, *(["--", *options] if options else []))
        self.url = re.search(r"https?://\S+", result.out)[0].rstrip("/")
        return result

    def stop(self):
        return self.lab.must("httpd", self.appliance.host, "stop")

    def kill(self):
        return self.lab.must("httpd", self.appliance.host, "kill")

    @property
    def running(self):
        return self.lab.command("httpd", self.appliance.host, "status").code == 0

    def end(self):
        """Whatever runs of it ends; for the end of a test."""
        if self.running:
            self.kill()

    def log(self):
        """Its lines in the system log of the appliance, and what it printed."""
        return self.lab.must("httpd", self.appliance.host, "log").out

    @property
    def pid(self):
        """Its process, as the appliance counts."""
        return int((self.lab.folder / "hosts" / self.appliance.host / "httpd").read_text().split()[0])

    @property
    def secure(self):
        return self.url.startswith("https:")

    @property
    def address(self):
        return urllib.parse.urlsplit(self.url).hostname

    @property
    def port(self):
        return urllib.parse.urlsplit(self.url).port

    # Connections. The certificate is the appliance's own, so nobody vouches for it.

    @staticmethod
    def tls_context():
        # Not the default one, which reads the certificates of all authorities each time.
        context = ssl.SSLContext(ssl.PROTOCOL_TLS_CLIENT)
        context.check_hostname = False
        context.verify_mode = ssl.CERT_NONE
        return context

    def connect(self, deadline=20.0, context=None):
        """A connected socket, TLS on it when the door speaks it."""
        plain = socket.create_connection((self.address, self.port), timeout=deadline)
        if not self.secure:
            return plain
        try:
            return (context or self.tls_context()).wrap_socket(plain, server_hostname=self.address)
        except BaseException:
            plain.close()
            raise

    def raw(self, data, deadline=20.0):
        """Sends bytes as they are, and answers all that comes until the door closes or nothing comes any more."""
        received = bytearray()
        end = time.monotonic() + deadline
        with self.connect(deadline) as connection:
            with contextlib.suppress(ConnectionError, ssl.SSLError):
                connection.sendall(data)
            with contextlib.suppress(TimeoutError, ConnectionError, ssl.SSLError):
                while (left := end - time.monotonic()) > 0:
                    connection.settimeout(left)
                    piece = connection.recv(65536)
                    if not piece:
                        break
                    received += piece
        return bytes(received)

    def connection(self, deadline=120.0):
        """A connection for several requests."""
        if self.secure:
            return http.client.HTTPSConnection(self.address, self.port, timeout=deadline, context=self.tls_context())
        return http.client.HTTPConnection(self.address, self.port, timeout=deadline)

    def request(self, method, path, body=None, headers=None, deadline=120.0, connection=None):
        """One request; a body that is no bytes goes as JSON. A header of None is not sent. Follows nothing."""
        sent = {}
        data = body
        if method == "POST":
            # As a browser does for the page's own scripts.
            sent = {"Origin": self.url, "Sec-Fetch-Site": "same-origin", "Content-Type": "application/json"}
            data = body if isinstance(body, bytes) else json.dumps(body if body is not None else {}).encode()
        sent.update(headers or {})
        own = connection is None
        connection = connection or self.connection(deadline)
        begin = time.monotonic()
        try:
            connection.request(method, path, data, {name: value for name, value in sent.items() if value is not None})
            reply = connection.getresponse()
            content = reply.read()
        finally:
            if own:
                connection.close()
        return Reply(reply.status, reply.headers, content, time.monotonic() - begin)

    def get(self, path, **more):
        return self.request("GET", path, **more)

    # Log-in.

    def visitor(self):
        """A browser that is not logged in."""
        return Visitor(self)

    def login(self, user="admin", password=None):
        """A browser that is logged in."""
        visitor = self.visitor()
        reply = visitor.login(user, password)
        assert reply.status == 200, (reply, self.log())
        return visitor

    def new_link(self):
        """A token that logs in once, issued by the appliance's server to root."""
        status, body = self.appliance.client.request("POST", "/session/new-link", b"{}", deadline=20)
        assert status == 200, (status, body)
        return json.loads(body)["data"]["token"]


class Visitor:
    """One browser: keeps its cookie and its CSRF token. Each request has a connection of its own, so that one object
    serves many threads; with KEEP it has one for all, and serves one thread."""

    def __init__(self, door, keep=False):
        self.door = door
        self.cookie = None
        self.csrf = None
        self.connection = door.connection() if keep else None

    def request(self, method, path, body=None, headers=None, **more):
        own = {}
        if self.cookie:
            own["Cookie"] = f"{COOKIE}={self.cookie}"
        if self.csrf and method == "POST":
            own["X-CSRF-Token"] = self.csrf
        reply = self.door.request(method, path, body, {**own, **(headers or {})}, connection=self.connection, **more)
        self._keep_cookie(reply)
        return reply

    def _keep_cookie(self, reply):
        for cookie in reply.cookies:
            name, _, rest = cookie.partition("=")
            value, _, attributes = rest.partition(";")
            if name.strip() == COOKIE:
                gone = not value or re.search(r"max-age=0\b", attributes, re.I)
                self.cookie = None if gone else value

    def _enter(self, path, body):
        reply = self.request("POST", path, body)
        if reply.status == 200:
            self.csrf = reply.json["data"]["csrf"]
        return reply

    def login(self, user="admin", password=None):
        return self._enter("/session/login",
                           {"user": user, "password": local_password(user) if password is None else password})

    def login_with(self, token):
        return self._enter("/session/link", {"token": token})

    def logout(self):
        reply = self.request("POST", "/session/logout", {})
        self.csrf = None
        return reply

    def session(self):
        """What the door says of this session."""
        return self.request("GET", "/session")

    def call(self, api, version, method, parameters=None, background=False, deadline=120.0):
        """Calls a method of the web API; the answer may be a failure, also one of the door."""
        headers = {"X-Background": "1"} if background else {}
        return self.request("POST", f"/webapi/{api}/{version}/{method}", parameters or {}, headers,
                            deadline=deadline).answer
