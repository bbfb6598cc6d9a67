"""vornctl join, and the password: where it comes from and where it never goes."""

import glob
import os
import signal
import subprocess
import threading
import time

from vornctl_case import DEADLINE, DIRECTORY, DOMAIN, Terminal, VornctlCase, main, ok, refused

SECRET = 'ca"n\\ary Ü 7'
STEPS = f"{DIRECTORY}/1/join_steps"
SET = f"{DOMAIN}/1/set"


def step(name, outcome, server="", detail="", milliseconds=10):
    return {"name": name, "server": server, "outcome": outcome, "detail": detail, "milliseconds": milliseconds}


def record(identifier, steps, **more):
    return ok({"id": identifier, "action": "join", "domain": "lab.test", "started": 1764230393, "finished": None,
               "success": None, "message": "", "steps": steps, "leftovers": [], **more})


class Join(VornctlCase):
    def join(self, *arguments, given=(SECRET + "\n").encode()):
        command = ("join", "lab.test", "--user", "Administrator", "--password-stdin")
        return self.run_program(*command, *arguments, given=given)

    def start_terminal(self, *arguments, **environment):
        terminal = Terminal(self.command(*arguments), self.environment(**environment))
        self.addCleanup(terminal.close)
        return terminal

    def test_the_request(self):
        self.script[SET] = ok(None)
        result = self.join()
        self.assertEqual(result.code, 0, result.err)
        self.assert_body(
            SET,
            {
                "enable_domain": True,
                "domain_name": "lab.test",
                "username": "Administrator",
                "password": SECRET,
                "manage_mode": 0,
            },
        )
        self.assertIn("The appliance is now a member of lab.test.", result.out)

    def test_the_request_with_everything(self):
        self.script[SET] = ok(None)
        self.join("--dns", "10.0.0.1, 10.0.0.2", "--no-trusted-domains", "--kdc", "dc1", "--netbios-name", "LAB",
                  "--fqdn", "lab.test", "--interface", "eth0", "--interface", "eth1,eth2")
        self.assert_body(
            SET,
            {
                "enable_domain": True,
                "domain_name": "lab.test",
                "username": "Administrator",
                "password": SECRET,
                "manage_mode": 1,
                "dns": "10.0.0.1,10.0.0.2",
                "advance_domain_conf": {
                    "enable_advance_option": True,
                    "kdc": "dc1",
                    "netbios_name": "LAB",
                    "fqdn_name": "lab.test",
                    "register_nics": ["eth0", "eth1", "eth2"],
                },
            },
        )

    def test_one_advanced_option_is_enough(self):
        self.script[SET] = ok(None)
        self.join("--interface", "eth0")
        self.assertEqual(self.server.sent(SET)[0].body["advance_domain_conf"],
                         {"enable_advance_option": True, "register_nics": ["eth0"]})

    def test_passwords_as_they_are_given(self):
        self.script[SET] = ok(None)
        for given, password in (
            (b"plain\n", "plain"),
            (b"plain", "plain"),
            (b"plain\r\n", "plain"),
            (b" two  blanks \nsecond line\n", " two  blanks "),
            (b"tab\tand\x01control\x7f\n", "tab\tand\x01control\x7f"),
            ("Ünïcödé€😀\n".encode(), "Ünïcödé€😀"),
            (b'"\\\\"\n', '"\\\\"'),
            (b"x" * 1024 + b"\n", "x" * 1024),
        ):
            self.server.requests.clear()
            self.assertEqual(self.join(given=given).code, 0)
            self.assertEqual(self.server.sent(SET)[0].body["password"], password)

    def test_passwords_that_can_not_be_sent(self):
        for given in (b"", b"\n", b"\r\n", b"x" * 1025 + b"\n", b"a\0b\n", b"\xff\xfe\n"):
            result = self.join(given=given)
            self.assertEqual(result.code, 2, given[:20])
            self.assertIn("password", result.err)
        self.assertEqual(self.server.sent(SET), [])

    def test_the_password_is_nowhere_but_in_the_request(self):
        seen = []

        def answer(request):
            # What other users could read while the call is running.
            for name in glob.glob("/proc/[0-9]*/cmdline") + glob.glob("/proc/[0-9]*/environ"):
                try:
                    with open(name, "rb") as file:
                        if SECRET.encode() in file.read():
                            seen.append(name)
                except OSError:
                    pass
            return refused(2607, "said")

        self.script[SET] = answer
        self.script[STEPS] = [record("old", []), record("new", [step("log in", "failed", "dc1", "no such password")])]
        result = self.join()
        self.assertEqual(result.code, 1)
        self.assertEqual(seen, [])
        self.assertNotIn(SECRET, result.out + result.err)
        with_password = [request for request in self.server.requests if b"ary" in request.raw]
        self.assertEqual([request.method for request in with_password], [SET])

    def test_a_password_on_the_command_line_is_refused_and_not_repeated(self):
        for arguments in (["--password", "hunter2"], ["--password=hunter2"], ["--password-stdin=hunter2"],
                          ["--pass=hunter2"], ["-phunter2"], ["hunter2"]):
            result = self.run_program("join", "lab.test", "--user", "a", *arguments, given=b"x\n")
            self.assertEqual(result.code, 2, arguments)
            self.assertNotIn("hunter2", result.out + result.err)
        result = self.run_program("call", DOMAIN, "1", "set", '{"a": [{"password": "hunter2"}]}')
        self.assertEqual(result.code, 2)
        self.assertNotIn("hunter2", result.out + result.err)
        self.assertEqual(self.server.requests, [])

    def test_the_environment_gives_no_password(self):
        done = subprocess.run(self.command("join", "lab.test", "--user", "a"), capture_output=True, timeout=DEADLINE,
                              stdin=subprocess.DEVNULL, start_new_session=True, check=False,
                              env=self.environment(PASSWD="hunter2", PASSWORD="hunter2", VORNCTL_PASSWORD="hunter2"))
        self.assertEqual(done.returncode, 2)
        self.assertIn(b"--password-stdin", b" ".join(done.stderr.split()))
        self.assertEqual(self.server.sent(SET), [])

    def test_the_terminal_asks_without_an_echo(self):
        self.script[SET] = ok(None)
        terminal = self.start_terminal("join", "lab.test", "--user", "Administrator")
        terminal.wait_for("Password of Administrator in lab.test: ")
        self.assertFalse(terminal.echoes())
        terminal.type("hunter2\n")
        self.assertEqual(terminal.end(), 0)
        self.assertNotIn("hunter2", terminal.shown)
        self.assertEqual(self.server.sent(SET)[0].body["password"], "hunter2")

    def test_the_terminal_is_put_back(self):
        self.script[SET] = lambda request: time.sleep(1) or ok(None)
        terminal = self.start_terminal("join", "lab.test", "--user", "Administrator")
        terminal.wait_for("Password")
        terminal.type("hunter2\n")
        terminal.wait_until(terminal.echoes, "the echo stays off")
        self.assertEqual(terminal.end(), 0)

    def test_control_c_at_the_question_puts_the_terminal_back(self):
        # A shell keeps the terminal open and shows what the program leaves behind.
        shell = ["/bin/sh", "-c", 'trap : INT; "$@"; echo "ended with $?"; read -r line', "sh",
                 *self.command("join", "lab.test", "--user", "a")]
        terminal = Terminal(shell, self.environment())
        self.addCleanup(terminal.close)
        terminal.wait_for("Password")
        self.assertFalse(terminal.echoes())
        terminal.type("hun\x03")
        terminal.wait_for("ended with 4")
        self.assertTrue(terminal.echoes())
        self.assertIn("Nothing was changed", terminal.shown)
        self.assertNotIn("hun\r", terminal.shown)
        terminal.type("\n")
        terminal.end()
        self.assertEqual(self.server.sent(SET), [])

    def test_control_z_at_the_question_is_not_obeyed(self):
        self.script[SET] = ok(None)
        # Under a shell with job control, which would get the terminal back.
        shell = ["/bin/bash", "-mc", '"$@"; echo "ended with $?"', "bash",
                 *self.command("join", "lab.test", "--user", "a")]
        terminal = Terminal(shell, self.environment())
        self.addCleanup(terminal.close)
        terminal.wait_for("Password")
        terminal.type("\x1a")
        time.sleep(0.3)
        terminal.type("hunter2\n")
        terminal.wait_for("ended with 0")
        terminal.end()

    def test_the_steps_are_shown_while_they_happen(self):
        done = threading.Event()
        first = step("find the controller", "ok", "dc1.lab.test", milliseconds=42)
        self.script[SET] = lambda request: done.wait(DEADLINE) and ok(None)
        self.script[STEPS] = [record("old", [step("of another join", "ok")]),
                              record("new", [first, step("log in", "running", "dc1.lab.test")])]
        terminal = self.start_terminal("join", "lab.test", "--user", "a")
        terminal.wait_for("Password")
        terminal.type("hunter2\n")
        terminal.wait_for("  ok      find the controller  [dc1.lab.test]  0.04 s")
        terminal.wait_for("...     log in  [dc1.lab.test]")
        self.assertNotIn("now a member", terminal.shown)
        second = step("log in", "ok", "dc1.lab.test", milliseconds=1500)
        self.script[STEPS] = record("new", [first, second], leftovers=["a file"])
        done.set()
        self.assertEqual(terminal.end(), 0)
        self.assertIn("log in  [dc1.lab.test]  1.50 s", terminal.shown)
        self.assertEqual(terminal.shown.count("find the controller"), 1)
        self.assertNotIn("of another join", terminal.shown)
        self.assertIn("a file", terminal.shown)
        self.assertIn("now a member", terminal.shown)

    def test_a_failure_with_its_story(self):
        self.script[SET] = refused(2606)
        self.script[STEPS] = [
            record("old", []),
            record("new", [step("find", "ok", "dc1"), step("connect to 445", "failed", "dc1", "timed out \x1b[2J")],
                   message="445/tcp is unreachable", leftovers=["the DNS servers"]),
        ]
        result = self.join()
        self.assertEqual(result.code, 1)
        for text in ("Port 445/tcp of the domain controller can't be reached.", "Why:", "Try:", "Code:    2606",
                     "connect to 445, asked: dc1", "timed out \\x1B[2J", "445/tcp is unreachable", "the DNS servers"):
            self.assertIn(text, result.err)
        self.assertNotIn("\x1b", result.out + result.err)
        self.assert_fits(result.err)
        self.assert_fits(result.out)

    def test_a_server_that_is_lost_in_the_middle(self):
        self.script[STEPS] = [record("old", []), record("new", [step("find", "ok"), step("log in", "running")])]
        self.script[SET] = lambda request: time.sleep(1) or b""
        result = self.join()
        self.assertEqual(result.code, 3)
        self.assertIn('"vornctl steps" shows how it goes on', " ".join(result.err.split()))

    def test_nobody_is_asked_when_there_is_no_server(self):
        self.server.close()
        for arguments in (["join", "lab.test", "--user", "a"], ["leave"]):
            terminal = self.start_terminal(*arguments)
            self.assertEqual(terminal.end(), 3)
            self.assertNotIn("?", terminal.shown)
            self.assertNotIn("Password", terminal.shown)

    def test_sigterm_at_the_question_ends_it(self):
        terminal = self.start_terminal("join", "lab.test", "--user", "a")
        terminal.wait_for("Password")
        os.kill(terminal.process, signal.SIGTERM)
        self.assertEqual(terminal.end(), 4)

    def test_a_join_of_a_member_says_so(self):
        self.script[f"{DOMAIN}/1/get"] = ok({"enable_domain": True, "domain_name": "OLD"})
        self.script[SET] = ok(None)
        self.assertIn("member of OLD at present", self.join().out)

    def test_no_steps_are_no_reason_to_stumble(self):
        self.script[SET] = refused(2607)
        for steps in (ok(None), ok([]), refused(210), b"nonsense", record("same", [step("old", "failed")])):
            self.script[STEPS] = steps
            result = self.join()
            self.assertEqual(result.code, 1)
            self.assertIn("Code:    2607", result.err)
            self.assertNotIn("Step:", result.err)

    def test_json_prints_the_answer_alone(self):
        self.script[SET] = refused(2607)
        self.script[STEPS] = record("new", [step("a", "ok")])
        result = self.join("--json")
        self.assertEqual(result.code, 1)
        self.assertEqual(result.out, '{"error":{"code":2607,"errors":null},"success":false}\n')
        self.assertEqual(result.err, "")
        self.assertEqual(self.server.sent(STEPS), [])

    def test_control_c_leaves_the_join_running(self):
        self.script[SET] = lambda request: time.sleep(5) or ok(None)
        terminal = self.start_terminal("join", "lab.test", "--user", "a")
        terminal.wait_for("Password")
        terminal.type("hunter2\n")
        terminal.wait_until(lambda: self.server.sent(SET), "nothing was sent")
        terminal.type("\x03")
        self.assertEqual(terminal.end(), 4)
        self.assertIn("vornctl steps", terminal.shown.replace("\r\n         ", " "))

    def test_names_are_shown_escaped(self):
        self.script[SET] = refused(2605)
        result = self.run_program("join", "lab\x1b[2J.test", "--user", "a\nb", "--password-stdin", given=b"x\n")
        self.assertNotIn("\x1b", result.out + result.err)
        self.assertIn("lab\\x1B[2J.test", result.out)

    def test_leave_asks_on_the_terminal(self):
        self.script[f"{DOMAIN}/1/get"] = ok({"enable_domain": True, "domain_name": "LAB"})
        self.script[SET] = ok(None)
        for answer, code, calls in (("n", 4, 0), ("", 4, 0), ("\x03", 4, 0), ("y", 0, 1)):
            self.server.requests.clear()
            terminal = self.start_terminal("leave")
            terminal.wait_for("Leave? [y/N] ")
            self.assertIn("leaves the domain LAB", terminal.shown)
            self.assertIn("stays on the domain controller", terminal.shown)
            terminal.type(answer + "\n")
            self.assertEqual(terminal.end(), code)
            self.assertEqual(len(self.server.sent(SET)), calls)

    def test_leave_names_the_computer_account_beforehand(self):
        self.script[f"{DOMAIN}/1/get"] = ok({"enable_domain": True, "domain_name": "LAB"})
        self.script[f"{DIRECTORY}/1/overview"] = ok({"computer_account": "NAS\x1b1$"})
        for arguments, fate in (([], "stays"), (["--delete-account", "--user", "adm"], "is deleted")):
            terminal = self.start_terminal("leave", *arguments)
            terminal.wait_for("Leave? [y/N] ")
            self.assertIn(f"computer account NAS\\x1B1$ {fate} on the domain controller",
                          " ".join(terminal.shown.split()))
            terminal.type("n\n")
            self.assertEqual(terminal.end(), 4)

    def test_no_file_is_written(self):
        self.script[SET] = ok(None)
        before = set(os.listdir(self.folder))
        done = subprocess.run(self.command("join", "lab.test", "--user", "a", "--password-stdin"), input=b"hunter2\n",
                              capture_output=True, timeout=DEADLINE, check=False, cwd=self.folder,
                              env=self.environment(HOME=self.folder, TMPDIR=self.folder))
        self.assertEqual(done.returncode, 0)
        self.assertEqual(set(os.listdir(self.folder)), before)


if __name__ == "__main__":
    main()
