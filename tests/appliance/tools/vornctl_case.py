"""What the tests of vornctl share: a server on a unix socket that answers from a script, a way to run the program, and
one to run it on a terminal."""

import fcntl
import json
import os
import pty
import re
import select
import shutil
import signal
import socket
import struct
import subprocess
import sys
import tempfile
import termios
import threading
import time
import unittest

DOMAIN = "VORN.Core.Directory.Domain"
OPTIONS = DOMAIN + ".Conf"
SCHEDULE = DOMAIN + ".Schedule"
DIRECTORY = "VORN.Appliance.Directory"
EVENTS = "VORN.Appliance.EventLog"

DEADLINE = 20  # seconds, of whatever a test waits for

# What "get" answers of a member.
MEMBER = {
    "enable_domain": True,
    "domain_name": "LAB",
    "domain_type": "AD",
    "manage_mode": 0,
    "dns": "10.0.0.1,10.0.0.2",
    "advance_domain_conf": {
        "enable_advance_option": False,
        "kdc": "",
        "netbios_name": "LAB",
        "fqdn_name": "LAB.TEST",
        "register_nics": ["all"],
    },
}


def ok(data):
    return {"success": True, "data": data}


def refused(code, errors=None):
    return {"success": False, "error": {"code": code, "errors": errors}}


class Request:
    def __init__(self, head, body):
        lines = head.decode().split("\r\n")
        self.verb, self.path, _ = lines[0].split(" ")
        self.headers = {name.lower(): value for name, value in (line.split(": ", 1) for line in lines[1:])}
        self.raw = body
        self.method = self.path.removeprefix("/webapi/")

    @property
    def body(self):
        return json.loads(self.raw)


class FakeServer:
    """Answers "API/VERSION/METHOD" with what `script` holds for it: an answer, a list of them (the last one stays), or
    a function of the request. An answer is an object, or bytes that are sent as they are. What the script does not name
    is answered like a method that does not exist."""

    def __init__(self, path):
        self.path = path
        self.script = {}
        self.requests = []
        self.lock = threading.Lock()
        self.listener = socket.socket(socket.AF_UNIX, socket.SOCK_STREAM)
        self.listener.bind(path)
        self.listener.listen(16)
        threading.Thread(target=self.accept, daemon=True).start()

    def close(self):
        if self.listener.fileno() >= 0:
            # Ends the accept, which a close alone would leave blocked.
            self.listener.shutdown(socket.SHUT_RDWR)
            self.listener.close()

    def accept(self):
        while True:
            try:
                connection, _ = self.listener.accept()
            except OSError:
                return
            threading.Thread(target=self.serve, args=(connection,), daemon=True).start()

    def serve(self, connection):
        with connection:
            connection.settimeout(DEADLINE)
            try:
                data = b""
                while b"\r\n\r\n" not in data:
                    data += self.receive(connection)
                head, _, body = data.partition(b"\r\n\r\n")
                length = re.search(rb"(?i)content-length: (\d+)", head)
                while length and len(body) < int(length.group(1)):
                    body += self.receive(connection)
                request = Request(head, body)
                with self.lock:
                    self.requests.append(request)
                    answer = self.script.get(request.method, refused(211, "no such method"))
                    if isinstance(answer, list):
                        answer = answer.pop(0) if len(answer) > 1 else answer[0]
                if callable(answer):
                    answer = answer(request)
                if not isinstance(answer, bytes):
                    text = json.dumps(answer).encode()
                    head = b"HTTP/1.1 200 OK\r\nContent-Type: application/json\r\nContent-Length: %d\r\n\r\n"
                    answer = head % len(text) + text
                connection.sendall(answer)
            except (ConnectionError, TimeoutError, BrokenPipeError):
                pass

    @staticmethod
    def receive(connection):
        data = connection.recv(65536)
        if not data:
            raise ConnectionError
        return data

    def sent(self, method):
        """The requests of a method, in their order."""
        with self.lock:
            return [request for request in self.requests if request.method == method]


class Result:
    def __init__(self, code, out, err):
        self.code = code
        self.out = out
        self.err = err


class VornctlCase(unittest.TestCase):
    program = ""  # set by main

    def setUp(self):
        self.folder = tempfile.mkdtemp(prefix="vornctl_test_")
        self.addCleanup(shutil.rmtree, self.folder)
        self.socket = os.path.join(self.folder, "vornd.sock")
        self.server = FakeServer(self.socket)
        self.addCleanup(self.server.close)
        self.script = self.server.script

    def command(self, *arguments):
        return [self.program, "--socket", self.socket, *arguments]

    def environment(self, **more):
        kept = {name: value for name, value in os.environ.items() if name.endswith("SAN_OPTIONS")}
        return {"PATH": "/usr/bin:/bin", "LC_ALL": "C.UTF-8", "TZ": "UTC", **kept, **more}

    def run_program(self, *arguments, given=None, **environment):
        """Runs it without a terminal, in a process group of its own."""
        done = subprocess.run(
            self.command(*arguments),
            input=given,
            stdin=subprocess.DEVNULL if given is None else None,
            capture_output=True,
            timeout=DEADLINE,
            start_new_session=True,
            env=self.environment(**environment),
            check=False,
        )
        self.assertGreaterEqual(done.returncode, 0, done.stderr.decode())
        self.assertNotIn(b"Sanitizer", done.stderr)
        return Result(done.returncode, done.stdout.decode(), done.stderr.decode())

    def assert_body(self, method, body, result=None):
        """The method was called once, with this body."""
        sent = self.server.sent(method)
        self.assertEqual(len(sent), 1, result.err if result else "")
        self.assertEqual(sent[0].body, body)

    def assert_fits(self, text, columns=80):
        for line in text.splitlines():
            self.assertLessEqual(len(line), columns, line)


class Terminal:
    """The program on a terminal of its own."""

    def __init__(self, command, environment, columns=80):
        self.shown = ""
        self.process, self.master = pty.fork()
        if self.process == 0:
            os.execve(command[0], command, environment)
        fcntl.ioctl(self.master, termios.TIOCSWINSZ, struct.pack("HHHH", 24, columns, 0, 0))

    def close(self):
        os.close(self.master)
        try:
            os.kill(self.process, signal.SIGKILL)
            os.waitpid(self.process, 0)
        except (ProcessLookupError, ChildProcessError):
            pass

    def echoes(self):
        return bool(termios.tcgetattr(self.master)[3] & termios.ECHO)

    def type(self, text):
        os.write(self.master, text.encode())

    def read(self, seconds):
        """What was shown within this time; None at the end."""
        if not select.select([self.master], [], [], seconds)[0]:
            return ""
        try:
            data = os.read(self.master, 65536)
        except OSError:
            return None
        if not data:
            return None
        self.shown += data.decode(errors="replace")
        return data

    def wait_for(self, text):
        end = time.monotonic() + DEADLINE
        while text not in self.shown:
            if time.monotonic() > end or self.read(0.2) is None:
                raise AssertionError(f"{text!r} was not shown: {self.shown!r}")

    def wait_until(self, condition, what):
        end = time.monotonic() + DEADLINE
        while not condition():
            if time.monotonic() > end:
                raise AssertionError(f"{what}: {self.shown!r}")
            self.read(0.05)

    def end(self):
        """Reads to the end and returns the exit code."""
        end = time.monotonic() + DEADLINE
        while self.read(0.2) is not None:
            if time.monotonic() > end:
                raise AssertionError(f"the program does not end: {self.shown!r}")
        _, status = os.waitpid(self.process, 0)
        if not os.WIFEXITED(status):
            raise AssertionError(f"the program was killed: {self.shown!r}")
        return os.WEXITSTATUS(status)


def main():
    """script PROGRAM [unittest's arguments]"""
    VornctlCase.program = sys.argv.pop(1)
    unittest.main(module="__main__")
