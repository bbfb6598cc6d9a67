"""What goes wrong: refusals, a server that is absent, slow or talks nonsense, wrong command lines."""

import json
import os
import re
import signal
import socket
import subprocess
import time

from vornctl_case import DEADLINE, DIRECTORY, DOMAIN, OPTIONS, Terminal, VornctlCase, main, ok, refused

# A command line for each method that a command can't do without.
COMMANDS = {
    f"{DOMAIN}/1/get": ["status"],
    f"{DOMAIN}/1/test_dc": ["test"],
    f"{DOMAIN}/2/get_domain_list": ["list"],
    f"{DOMAIN}/1/get_domain_list": ["list", "--v1"],
    f"{DOMAIN}/1/update_start": ["refresh"],
    f"{DOMAIN}/1/set": ["leave", "--yes"],
    f"{OPTIONS}/1/get": ["options"],
    f"{OPTIONS}/1/set": ["options", "--sync-time", "on"],
    f"{DOMAIN}.Schedule/1/get": ["schedule"],
    f"{DOMAIN}.Schedule/1/set": ["schedule", "--off"],
    f"{DIRECTORY}/1/users": ["users"],
    f"{DIRECTORY}/1/groups": ["groups"],
    f"{DIRECTORY}/1/join_steps": ["steps"],
    "VORN.Appliance.EventLog/1/list": ["events"],
    "/session/new-link": ["link"],
    "Some.Api/3/method": ["call", "Some.Api", "3", "method"],
}


def plain(body, status="200 OK"):
    return b"HTTP/1.1 %s\r\nContent-Length: %d\r\n\r\n%s" % (status.encode(), len(body), body)


class Failures(VornctlCase):
    def test_every_command_tells_a_refusal(self):
        for method, arguments in COMMANDS.items():
            self.script.clear()
            self.script[method] = refused(2617, {"why": "disk \x1b full"})
            result = self.run_program(*arguments)
            self.assertEqual(result.code, 1, method)
            self.assertIn("vornctl: Something in the appliance itself failed.\n", result.err)
            self.assertIn("  Why:     ", result.err)
            self.assertIn("  Try:     ", result.err)
            self.assertIn("  Code:    2617\n", result.err)
            self.assertIn("disk", result.err)
            self.assertNotIn("\x1b", result.out + result.err)
            self.assert_fits(result.err)

    def test_every_command_prints_a_refusal_as_json(self):
        for method, arguments in COMMANDS.items():
            self.script.clear()
            self.script[method] = refused(2617, "why")
            result = self.run_program(*arguments, "--json")
            self.assertEqual(result.code, 1, method)
            self.assertEqual(json.loads(result.out), refused(2617, "why"))
            self.assertEqual(result.err, "")

    def test_a_code_that_the_catalogue_does_not_know(self):
        self.script[f"{DOMAIN}/1/get"] = refused(4711)
        result = self.run_program("status")
        self.assertEqual(result.code, 1)
        self.assertIn("4711", result.err)

    def test_a_refusal_of_the_server_itself(self):
        self.script[f"{DOMAIN}/1/get"] = plain(json.dumps(refused(240, "busy")).encode(), "503 Service Unavailable")
        result = self.run_program("status")
        self.assertEqual(result.code, 1)
        self.assertIn("The appliance is busy.", result.err)
        self.assertIn("  Details: busy\n", result.err)

    def test_no_server(self):
        self.server.close()
        for path, text in (
            (self.socket, "nobody listens"),
            (self.folder + "/none", "no socket"),
            (self.folder + "/none/none", "no socket"),
            (self.folder, "nobody listens"),
        ):
            result = self.run_program("status", "--socket", path)
            self.assertEqual(result.code, 3, result.err)
            self.assertIn(text, result.err)
            self.assertEqual((result.out, result.err.count("\n")), ("", 1))

    def test_every_command_ends_with_3_without_a_server(self):
        self.server.close()
        for arguments in COMMANDS.values():
            result = self.run_program(*arguments)
            self.assertEqual(result.code, 3, arguments)
            self.assertIn("vornd is not running", result.err)

    def test_no_permission(self):
        os.chmod(self.socket, 0)
        os.chmod(self.folder, 0o755)
        if os.geteuid() != 0:
            self.skipTest("needs root")
        done = subprocess.run(
            ["/usr/bin/setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", *self.command("status")],
            capture_output=True,
            timeout=DEADLINE,
            env=self.environment(),
            check=False,
        )
        self.assertEqual(done.returncode, 3, done.stderr)
        self.assertIn(b"Run vornctl as root", b" ".join(done.stderr.split()))

    def test_a_path_that_can_be_no_socket(self):
        result = self.run_program("status", "--socket", "/" + "x" * 200)
        self.assertEqual(result.code, 2)

    def test_answers_that_are_none(self):
        for answer in (
            b"",
            b"hello\r\n\r\n",
            b"SSH-2.0-x\r\n",
            b"HTTP/1.1 200 OK\r\nContent-Length: 100\r\n\r\n{",
            b"HTTP/1.1 200 OK\r\nContent-Length: x\r\n\r\n",
            b"HTTP/1.1 200 OK\r\nX: " + b"y" * 100000 + b"\r\n\r\n",
            plain(b""),
            plain(b"<html>\x1b[2J</html>", "502 Bad Gateway"),
            plain(b"[" * 100000),
            plain(b'{"success":tru'),
            plain(b"null"),
            plain(b"[]"),
            plain(b'"success"'),
            plain(b'{"success":"yes","data":{}}'),
            plain(b'{"success":false}'),
            plain(b'{"success":false,"error":7}'),
            plain(b'{"success":false,"error":{"code":"2617"}}'),
            plain(b'{"success":true,"data":null} trailing'),
            plain(b'{"success":true,"success":true,"data":null}'),
            plain(b'{"success":false,"error":{"code":99999999999999999999,"errors":null}}'),
        ):
            self.script[f"{DOMAIN}/1/get"] = answer
            result = self.run_program("status")
            self.assertEqual(result.code, 3, answer[:80])
            self.assertEqual(result.out, "")
            self.assertNotIn("\x1b", result.err)
            self.assertEqual(result.err.count("\n"), 1, result.err)

    def test_data_of_another_shape_than_expected(self):
        for method, arguments in COMMANDS.items():
            for data in (None, 7, "text", [], [[[]]], {}, {"enable_domain": 1},
                         {"domain_list": [7, {}, ["a"], [[], {}, 1]]},
                         {"entries": [7, None, {}], "total": "x"}, {"events": [None, {"time": 1e300, "code": -1}]},
                         {"steps": [None, {"milliseconds": "x"}], "id": "7", "started": -1},
                         {"date_type": 0, "week_name": "9,,x", "hour": 1e9, "repeat_hour": 1},
                         {"date_type": 1, "date": "//", "repeat": 99, "hour": -5, "min": 12345678901},
                         {"enable_domain": True, "dns": 7, "domain_name": [], "advance_domain_conf": 3}):
                self.script.clear()
                self.script[method] = ok(data)
                self.script[f"{DOMAIN}/1/update_status"] = ok({"status": "finish"})
                result = self.run_program(*arguments)
                self.assertIn(result.code, (0, 1, 3, 5), (method, data, result.err))
                self.assertNotIn("Traceback", result.err)
                self.assertNotIn("Value is not", result.err)

    def test_a_server_that_closes_at_once(self):
        def close_early(request):
            return b""

        self.script[f"{DOMAIN}/1/get"] = close_early
        result = self.run_program("status")
        self.assertEqual(result.code, 3)
        self.assertIn("without an answer", result.err)

    def test_a_server_that_answers_before_it_has_read_the_body(self):
        path = os.path.join(self.folder, "early.sock")
        with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as listener:
            listener.bind(path)
            listener.listen(1)
            with subprocess.Popen(
                [self.program, "--socket", path, "call", DOMAIN, "1", "get", json.dumps({"x": "y" * 60000})],
                stderr=subprocess.PIPE, stdout=subprocess.PIPE, env=self.environment()) as process:
                connection, _ = listener.accept()
                with connection:
                    connection.recv(10)
                    text = json.dumps(refused(217, "too large")).encode()
                    connection.sendall(plain(text, "413 Too Large"))
                    connection.shutdown(socket.SHUT_WR)
                    out, err = process.communicate(timeout=DEADLINE)
        self.assertEqual((process.returncode, out), (1, b""))
        self.assertIn(b"The request's body is too large.", err)

    def test_a_slow_server(self):
        self.script[f"{DOMAIN}/1/get"] = lambda request: time.sleep(5) or ok({"enable_domain": False})
        begin = time.monotonic()
        result = self.run_program("status", "--timeout", "1")
        self.assertLess(time.monotonic() - begin, 4)
        self.assertEqual(result.code, 3)
        self.assertIn("did not answer within 1 s", result.err)

    def test_a_listener_that_never_answers(self):
        path = os.path.join(self.folder, "deaf.sock")
        with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as deaf:
            deaf.bind(path)
            deaf.listen(1)
            begin = time.monotonic()
            result = self.run_program("test", "--timeout", "1", "--socket", path)
        self.assertLess(time.monotonic() - begin, 4)
        self.assertEqual(result.code, 3)

    def test_signals_while_waiting(self):
        self.script[f"{DOMAIN}/1/get"] = lambda request: time.sleep(8) or ok({"enable_domain": False})
        for number in (signal.SIGINT, signal.SIGTERM, signal.SIGHUP):
            self.server.requests.clear()
            with subprocess.Popen(self.command("status"), stderr=subprocess.PIPE, env=self.environment()) as process:
                end = time.monotonic() + DEADLINE
                while not self.server.requests and time.monotonic() < end:
                    time.sleep(0.02)
                process.send_signal(number)
                begin = time.monotonic()
                _, err = process.communicate(timeout=DEADLINE)
            self.assertLess(time.monotonic() - begin, 3)
            self.assertEqual(process.returncode, 4)
            self.assertIn(b"Interrupted.", err)

    def test_wrong_usage(self):
        for arguments, text in (
            ([], "A command is missing"),
            (["frob"], 'There is no command "frob"'),
            (["fr\nob"], 'There is no command "fr\\x0Aob"'),
            (["--frob"], "There is no option --frob"),
            (["status", "--frob=7"], "There is no option --frob"),
            (["status", "extra"], "too many arguments"),
            (["join", "LAB"], "--user is required"),
            (["join", "--user", "a"], "DOMAIN is required"),
            (["join", "LAB", "--user"], "--user needs a value"),
            (["users", "--limit", "1001"], "--limit"),
            (["users", "--limit", "0"], "--limit"),
            (["users", "--limit", "ten"], "--limit"),
            (["users", "--offset", "-1"], "--offset"),
            (["options", "--server-signing", "yes"], "--server-signing"),
            (["options", "--nested-groups", "100"], "--nested-groups"),
            (["status", "--timeout", "0"], "--timeout"),
            (["explain", "abc"], "CODE"),
        ):
            result = self.run_program(*arguments)
            self.assertEqual(result.code, 2, arguments)
            command = "vornctl" if text.startswith("There is no command") or arguments[:1] in ([], ["--frob"]) else (
                f"vornctl {arguments[0]}")
            self.assertRegex(result.err, rf'^vornctl: [^\n]*{re.escape(text)}[^\n]*; "{command} --help" tells[^\n]+\n$')
            self.assertEqual(result.out, "")
        self.assertEqual(self.server.requests, [])

    def test_arguments_that_are_not_utf8(self):
        done = subprocess.run(self.command("users", "--search", b"\xff\xfe"), capture_output=True, timeout=DEADLINE,
                              env=self.environment(), check=False)
        self.assertEqual(done.returncode, 2)
        self.assertIn(b"not UTF-8", done.stderr)

    def test_nothing_at_all_is_a_missing_command(self):
        done = subprocess.run([self.program], capture_output=True, timeout=DEADLINE, check=False,
                              env=self.environment())
        self.assertEqual((done.returncode, done.stdout), (2, b""))
        self.assertEqual(done.stderr, b'vornctl: A command is missing; "vornctl --help" tells what it takes.\n')

    def test_a_line_stays_one_on_a_narrow_terminal(self):
        terminal = Terminal(self.command("users", "--password", "x"), self.environment(), columns=40)
        self.addCleanup(terminal.close)
        self.assertEqual(terminal.end(), 2)
        self.assertEqual(terminal.shown.count("\n"), 1, terminal.shown)

    def test_help_fits_the_terminal_and_ends_with_0(self):
        commands = ["status", "join", "leave", "test", "list", "refresh", "options", "schedule", "users", "groups",
                    "events", "steps", "link", "explain", "call"]
        general = self.run_program("--help")
        self.assertEqual((general.code, general.err), (0, ""))
        for command in commands:
            self.assertRegex(general.out, rf"\n  {command} +[A-Z].*[.?]\n")
            result = self.run_program(command, "--help")
            self.assertEqual((result.code, result.err), (0, ""))
            self.assertIn(f"Usage: vornctl {command}", result.out)
            self.assert_fits(result.out)
        self.assertNotIn("__complete", general.out)
        self.assert_fits(general.out)
        self.assertRegex(self.run_program("--version").out, r"^vornctl \d+\.\d+\.\d+\n$")

    def test_colours_on_a_terminal(self):
        self.script[f"{DOMAIN}/1/get"] = refused(2622)
        for environment, coloured in (({"TERM": "xterm"}, True), ({"TERM": "xterm", "NO_COLOR": "1"}, False),
                                      ({"TERM": "dumb"}, False), ({}, False)):
            terminal = Terminal(self.command("status"), self.environment(**environment))
            self.addCleanup(terminal.close)
            self.assertEqual(terminal.end(), 1)
            self.assertEqual("\x1b[" in terminal.shown, coloured, environment)


if __name__ == "__main__":
    main()
