"""vornctl refresh: started, followed to its end, stopped, left running."""

import json
import time

from vornctl_case import DIRECTORY, DOMAIN, Terminal, VornctlCase, main, ok, refused

START = f"{DOMAIN}/1/update_start"
STATUS = f"{DOMAIN}/1/update_status"
STOP = f"{DOMAIN}/1/update_stop"
PROGRESS = f"{DIRECTORY}/1/refresh_progress"
TASK = ok({"task_id": "DomainUpdate_7"})
UPDATING = ok({"status": "updating"})
FINISH = ok({"status": "finish"})


def progress(count, **more):
    now = time.time() // 1
    return ok({"kind": "user", "domain": "LAB", "count": count, "domains_done": 0, "domains": 2, "started": now,
               "updated": now, "errors": [], **more})


class Refresh(VornctlCase):
    def start_terminal(self, *arguments):
        terminal = Terminal(self.command("refresh", *arguments), self.environment())
        self.addCleanup(terminal.close)
        return terminal

    def test_followed_to_its_end(self):
        self.script.update({START: TASK, STATUS: [UPDATING, UPDATING, FINISH]})
        self.script[f"{DIRECTORY}/1/domains"] = ok(
            {"domains": [{"domain": "LAB", "kind": "user", "count": 5009, "fetched": 1764230400}]})
        result = self.run_program("refresh")
        self.assertEqual((result.code, result.err), (0, ""))
        self.assertIn("The refresh is done.\n", result.out)
        self.assertIn("LAB     users     5009  2025-11-27 08:00:00\n", result.out)
        self.assert_body(START, {})
        sent = self.server.sent(STATUS)
        self.assertEqual([request.body for request in sent], [{"task_id": "DomainUpdate_7"}] * 3)

    def test_one_domain(self):
        self.script.update({START: TASK, STATUS: FINISH})
        self.run_program("refresh", "--domain", "LAB")
        self.assert_body(START, {"domain_name": "LAB"})

    def test_as_json(self):
        self.script.update({START: TASK, STATUS: [UPDATING, FINISH]})
        result = self.run_program("refresh", "--json")
        self.assertEqual(json.loads(result.out), FINISH)
        self.assertEqual(result.err, "")

    def test_without_waiting(self):
        self.script[START] = TASK
        result = self.run_program("refresh", "--no-wait")
        self.assertEqual(result.code, 0)
        self.assertIn("DomainUpdate_7", result.out)
        self.assertEqual(self.server.sent(STATUS), [])
        self.assertEqual(json.loads(self.run_program("refresh", "--no-wait", "--json").out), TASK)

    def test_a_failed_one_names_the_domain(self):
        self.script.update({START: TASK, STATUS: [UPDATING, refused(2623)]})
        error = {"domain": "OTHER", "kind": "group", "reason": "no \x1b controller"}
        self.script[PROGRESS] = progress(7, errors=[error])
        result = self.run_program("refresh")
        self.assertEqual(result.code, 1)
        self.assertIn("Code:    2623", result.err)
        self.assertIn("groups of OTHER: no \\x1B controller", result.err)

    def test_a_stopped_one(self):
        self.script.update({START: TASK, STATUS: [UPDATING, refused(121)]})
        result = self.run_program("refresh")
        self.assertEqual(result.code, 1)
        self.assertIn("was stopped", result.err)

    def test_one_that_runs_already_is_followed(self):
        self.script[START] = refused(2626)
        self.script[PROGRESS] = [progress(7, running=True), progress(8, running=True), progress(9, running=False)]
        result = self.run_program("refresh")
        self.assertEqual(result.code, 0, result.err)
        self.assertIn("running already", result.err)
        self.assertIn("The refresh has ended.", result.out)
        self.assertGreaterEqual(len(self.server.sent(PROGRESS)), 3)

    def test_one_that_runs_already_without_a_word_that_it_runs(self):
        now = time.time() // 1
        self.script[START] = refused(2626)
        for updated, kind, done, over in ((now - 60, "user", 0, True), (now - 10, "group", 2, True),
                                          (now + 60, "user", 2, False), (now + 60, "group", 1, False)):
            self.server.requests.clear()
            look = progress(7, updated=updated, kind=kind, domains_done=done)
            self.script[PROGRESS] = look if over else [look, look, progress(7, running=False)]
            result = self.run_program("refresh")
            self.assertEqual(result.code, 0, result.err)
            # The last look is for the reasons of failures.
            self.assertEqual(len(self.server.sent(PROGRESS)), 2 if over else 4)

    def test_one_that_runs_already_and_fails(self):
        self.script[START] = refused(2626)
        self.script[PROGRESS] = progress(9, running=False, errors=[{"domain": "LAB", "kind": "user", "reason": "dead"}])
        result = self.run_program("refresh")
        self.assertEqual(result.code, 1)
        self.assertIn("users of LAB: dead", result.err)

    def test_one_that_runs_already_without_waiting(self):
        self.script[START] = refused(2626)
        result = self.run_program("refresh", "--no-wait")
        self.assertEqual(result.code, 0)
        self.assertIn("running already", result.out)

    def test_a_start_that_names_no_task(self):
        self.script[START] = ok(None)
        self.assertEqual(self.run_program("refresh").code, 3)

    def test_a_restart_of_the_server_meanwhile(self):
        self.script.update({START: TASK, STATUS: [UPDATING, b"", b"", FINISH]})
        result = self.run_program("refresh")
        self.assertEqual(result.code, 0, result.err)

    def test_the_progress_line(self):
        self.script.update({START: TASK, STATUS: [UPDATING] * 3 + [FINISH], PROGRESS: progress(2000)})
        terminal = self.start_terminal()
        terminal.wait_for("Refreshing: 2000 users of LAB, domain 1 of 2, ")
        self.assertEqual(terminal.end(), 0)
        self.assertTrue(terminal.shown.endswith("\r\x1b[KThe refresh is done.\r\n"), terminal.shown)

    def test_control_c_stops_it(self):
        self.script.update({START: TASK, STATUS: UPDATING, STOP: ok(None)})
        terminal = self.start_terminal()
        terminal.wait_until(lambda: self.server.sent(STATUS), "the task is not followed")
        terminal.type("\x03")
        terminal.wait_for("Stop the refresh?")
        terminal.type("what\n")
        terminal.wait_until(lambda: terminal.shown.count("Stop the refresh?") == 2, "the question is not asked again")
        terminal.type("s\n")
        self.assertEqual(terminal.end(), 4)
        self.assert_body(STOP, {})
        self.assertIn("has been stopped", terminal.shown)

    def test_control_c_leaves_it_running(self):
        self.script.update({START: TASK, STATUS: UPDATING, STOP: ok(None)})
        for answer in ("l\n", "\x03"):
            self.server.requests.clear()
            terminal = self.start_terminal()
            terminal.wait_until(lambda: self.server.sent(STATUS), "the task is not followed")
            terminal.type("\x03")
            terminal.wait_for("Stop the refresh?")
            terminal.type(answer)
            self.assertEqual(terminal.end(), 4)
            self.assertEqual(self.server.sent(STOP), [])
            self.assertIn("goes on", terminal.shown)

    def test_control_c_and_on(self):
        self.script.update({START: TASK, STATUS: UPDATING})
        terminal = self.start_terminal()
        terminal.wait_until(lambda: self.server.sent(STATUS), "the task is not followed")
        terminal.type("\x03")
        terminal.wait_for("Stop the refresh?")
        self.script[STATUS] = FINISH
        terminal.type("w\n")
        self.assertEqual(terminal.end(), 0)
        self.assertIn("The refresh is done.", terminal.shown)

    def test_a_stop_that_fails(self):
        self.script.update({START: TASK, STATUS: UPDATING, STOP: refused(117)})
        terminal = self.start_terminal()
        terminal.wait_until(lambda: self.server.sent(STATUS), "the task is not followed")
        terminal.type("\x03")
        terminal.wait_for("Stop the refresh?")
        terminal.type("s\n")
        self.assertEqual(terminal.end(), 1)
        self.assertIn("117", terminal.shown)


if __name__ == "__main__":
    main()
