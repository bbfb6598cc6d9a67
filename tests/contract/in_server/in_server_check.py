#!/usr/bin/python3
"""Holds a server of the web API against the contract: requests, answers and background tasks, as a module sees them.

    in_server_check.py --call COMMAND [--server COMMAND] [TEST...]

The server has to have loaded contract_module.so. COMMAND of --call is run as "COMMAND API VERSION METHOD -" with a JSON
object on its input, and prints the server's answer, {"success": ..., "data": ...} or {"success": false, "error": {"code":
..., "errors": ...}}; its exit code does not count. With --server that command is started first and ended afterwards."""

import argparse
import json
import os
import shlex
import signal
import subprocess
import sys
import threading
import time
import unittest

API = "Contract.Test"
GROUP = "admin"
DEADLINE = 30  # seconds, of whatever a test waits for


class Server:
    """The server under test, when it is this program's to start."""

    def __init__(self, command):
        self.process = subprocess.Popen(shlex.split(command), stdin=subprocess.DEVNULL) if command else None

    def has_ended(self):
        return self.process is not None and self.process.poll() is not None

    def end(self):
        if self.process is None:
            return
        self.process.terminate()
        try:
            self.process.wait(DEADLINE)
        except subprocess.TimeoutExpired:
            self.process.kill()
            self.process.wait()


class InServer(unittest.TestCase):
    call_command = []
    server_command = ""

    @classmethod
    def setUpClass(cls):
        cls.server = Server(cls.server_command)
        end = time.monotonic() + DEADLINE
        while (answer := cls.ask("version", {}, check=False)) is None or not answer.get("success"):
            if time.monotonic() > end or cls.server.has_ended():
                cls.server.end()
                raise RuntimeError(f"the server does not serve {API}; has it loaded contract_module.so? {answer}")
            time.sleep(0.05)

    @classmethod
    def tearDownClass(cls):
        cls.server.end()

    def setUp(self):
        self.prefix = f"Contract{os.getpid()}x{time.monotonic_ns()}"

    def tearDown(self):
        for task in self.tasks():
            self.ask("stop", {"id": task, "force": True})

    @classmethod
    def ask(cls, method, parameters, version=1, check=True):
        """The server's whole answer; None when there is none and `check` is not set."""
        command = [*cls.call_command, API, str(version), method, "-"]
        done = subprocess.run(command, input=json.dumps(parameters), capture_output=True, text=True, timeout=DEADLINE)
        try:
            return json.loads(done.stdout)
        except ValueError:
            if check:
                raise AssertionError(f"no JSON from {command}: {done.stdout!r} {done.stderr!r}") from None
            return None

    def data(self, method, parameters, version=1):
        answer = self.ask(method, parameters, version)
        self.assertIs(answer["success"], True, answer)
        return answer["data"]

    def start(self, body, **parameters):
        data = self.data("start", {"body": body, "group": GROUP, "prefix": self.prefix, **parameters})
        self.assertEqual(["task_id"], list(data))
        self.assertIsInstance(data["task_id"], str)
        return data["task_id"]

    def tasks(self):
        return self.data("list", {"prefix": self.prefix, "groups": [GROUP]})["tasks"][GROUP]

    def status(self, task):
        outcome = self.data("status", {"id": task})
        self.assertEqual({"done": True, "error": 0}, {name: outcome[name] for name in ("done", "error")})
        return outcome["status"]

    def until(self, task, condition):
        end = time.monotonic() + DEADLINE
        while not condition(status := self.status(task)):
            self.assertLess(time.monotonic(), end, f"still {status}")
            time.sleep(0.02)
        return status

    def end_of(self, task):
        return self.until(task, lambda status: status["finish"])

    def assert_failed(self, status):
        self.assertIs(status["finish"], True)
        self.assertIs(status["success"], False)
        self.assertIsInstance(status["error"]["code"], int)
        self.assertNotEqual(0, status["error"]["code"])
        self.assertIn("errors", status["error"])

    # ---- Requests and responses ----

    def test_parameters_arrive_as_they_were_sent(self):
        sent = {"text": "a \"b\" \\ \u00e4\u20ac", "empty": "", "number": -7, "large": 2 ** 31 - 1, "part": 0.5,
                "yes": True, "list": [1, [2], {}], "object": {"inner": {"a": None}}}
        shown = self.data("show_request", {**sent, "names": list(sent)})
        self.assertEqual({name: {"has": True, "value": value} for name, value in sent.items()}, shown)

    def test_an_absent_parameter_answers_the_fallback(self):
        shown = self.data("show_request", {"names": ["absent", ""], "Absent": 1})
        self.assertEqual({"has": False, "value": "fallback"}, shown["absent"])
        self.assertEqual({"has": False, "value": "fallback"}, shown[""])

    def test_a_parameter_that_is_null_is_there(self):
        shown = self.data("show_request", {"names": ["nothing"], "nothing": None})
        self.assertEqual({"has": True, "value": None}, shown["nothing"])

    def test_success_carries_its_data(self):
        for data in ({"a": [1, "two", None]}, [], "text", 5, True, None):
            answer = self.ask("answer", {"answers": [{"data": data}]})
            self.assertEqual({"success": True, "data": data}, {name: answer[name] for name in ("success", "data")})

    def test_failure_carries_its_code_and_errors(self):
        for errors in (None, 122, {"name": "x"}):
            answer = self.ask("answer", {"answers": [{"code": 2618, "errors": errors}]})
            self.assertIs(answer["success"], False)
            self.assertEqual(2618, answer["error"]["code"])
            self.assertEqual(errors, answer["error"].get("errors"))

    def test_the_last_answer_counts(self):
        answer = self.ask("answer", {"answers": [{"data": 1}, {"code": 2600, "errors": None}, {"data": {"last": 1}}]})
        self.assertEqual((True, {"last": 1}), (answer["success"], answer["data"]))
        answer = self.ask("answer", {"answers": [{"code": 1, "errors": None}, {"data": 1}, {"code": 2, "errors": 3}]})
        self.assertEqual((False, 2, 3), (answer["success"], answer["error"]["code"], answer["error"]["errors"]))

    def test_an_exception_fails_its_call_and_no_other(self):
        self.assertIs(self.ask("throw", {})["success"], False)
        self.assertEqual(1, self.data("version", {}))

    def test_versions_are_told_apart(self):
        self.assertEqual([1, 2], [self.data("version", {}, version) for version in (1, 2)])

    def test_calls_at_once_get_their_own_answers(self):
        wrong = []

        def call(number):
            for _ in range(3):
                data = self.ask("answer", {"answers": [{"data": number}]}).get("data")
                if data != number:
                    wrong.append((number, data))

        threads = [threading.Thread(target=call, args=(number,)) for number in range(6)]
        for thread in threads:
            thread.start()
        for thread in threads:
            thread.join(DEADLINE)
        self.assertEqual([], wrong)

    # ---- Background tasks ----

    def test_a_task_runs_to_its_end(self):
        task = self.start("steps", steps=3, pause=0)
        status = self.end_of(task)
        self.assertIs(status["success"], True)
        self.assertEqual(3, status["data"]["step"])
        self.assertNotIn("error", status)

    def test_a_polling_object_may_get_its_request_later(self):
        self.assertEqual(2, self.end_of(self.start("steps", steps=2, pause=0, late=True))["data"]["step"])

    def test_a_task_shows_its_progress(self):
        task = self.start("steps", steps=3, pause=2000)
        status = self.until(task, lambda status: status["data"] and status["data"]["step"] >= 1)
        self.assertIs(status["finish"], False)
        self.assertIs(status["success"], True)
        self.assertEqual(3, self.end_of(task)["data"]["step"])

    def test_a_start_does_not_wait_for_its_task(self):
        begin = time.monotonic()
        task = self.start("steps", steps=1, pause=20000)
        self.assertLess(time.monotonic() - begin, 15)
        self.assertIs(self.status(task)["finish"], False)

    def test_a_task_sees_the_parameters_of_its_request(self):
        data = self.end_of(self.start("steps", steps=1, pause=0, seen={"domain_name": ["LAB"]}))["data"]
        self.assertEqual({"domain_name": ["LAB"]}, data["seen"])
        self.assertIs(data["user_data_is_null"], True)

    def test_a_task_that_fails_answers_its_own_code(self):
        status = self.end_of(self.start("fails"))
        self.assert_failed(status)
        self.assertEqual({"code": 2623, "errors": {"why": "asked to"}}, status["error"])

    def test_an_exception_ends_a_task_as_failed(self):
        self.assert_failed(self.end_of(self.start("throws")))
        self.assertEqual(1, self.data("version", {}), "the server is there")

    def test_a_task_that_is_killed_does_not_run_for_ever(self):
        task = self.start("stays")
        pids = self.until(task, lambda status: status["data"])["data"]
        self.assertTrue(self.lives(pids["pid"]), f"the task's process can't be seen from here: {pids}")
        os.kill(pids["pid"], signal.SIGKILL)
        self.assert_failed(self.end_of(task))
        if self.lives(pids["child"]):
            os.kill(pids["child"], signal.SIGKILL)

    def test_ids_begin_with_their_prefix_and_differ(self):
        ids = [self.start("steps", steps=1, pause=0) for _ in range(3)]
        self.assertEqual(3, len(set(ids)))
        for task in ids:
            self.assertTrue(task.startswith(self.prefix), task)

    def test_tasks_are_listed_by_group_and_prefix(self):
        ids = [self.start("steps", steps=1, pause=0) for _ in range(2)]
        other = self.start("steps", steps=1, pause=0, prefix="Other" + self.prefix)
        listed = self.data("list", {"prefix": self.prefix, "groups": [GROUP, "contract_others"]})
        self.assertEqual({"done": True, "error": 0}, {name: listed[name] for name in ("done", "error")})
        self.assertEqual({GROUP, "contract_others"}, set(listed["tasks"]))
        self.assertEqual(sorted(ids), sorted(listed["tasks"][GROUP]))
        self.assertEqual([], listed["tasks"]["contract_others"])
        self.assertEqual({GROUP: [other]}, self.data("list", {"prefix": "Other" + self.prefix, "groups": [GROUP]})["tasks"])

    def test_without_tasks_a_group_is_an_empty_list(self):
        self.assertEqual({GROUP: []}, self.data("list", {"prefix": "None" + self.prefix, "groups": [GROUP]})["tasks"])

    def test_an_ended_task_is_kept_until_it_is_to_go(self):
        kept = self.start("steps", steps=1, pause=0)
        self.assertEqual(self.end_of(kept), self.end_of(kept))
        self.assertIn(kept, self.tasks())
        gone = self.start("steps", steps=1, pause=0, remove=True)
        self.end_of(gone)
        self.assertIs(self.data("status", {"id": gone})["done"], False)
        self.assertNotIn(gone, self.tasks())

    def test_a_stopped_task_ends_with_all_that_it_started(self):
        task = self.start("stays")
        pids = self.until(task, lambda status: status["data"])["data"]
        self.assertIs(self.status(task)["finish"], False)
        self.assertEqual({"done": True, "error": 0}, self.data("stop", {"id": task, "force": True}))
        self.assertIs(self.end_of(task)["finish"], True)
        for name in ("pid", "child"):
            self.assertFalse(self.lives(pids[name]), name)

    def test_a_stop_leaves_an_ended_task_as_it_is(self):
        task = self.start("steps", steps=2, pause=0)
        status = self.end_of(task)
        self.assertIs(self.data("stop", {"id": task, "force": True})["done"], True)
        self.assertEqual(status, self.status(task))

    def test_unknown_ids_are_refused(self):
        task = self.start("steps", steps=1, pause=0)
        for wrong in ("", "nonsense", task + "0", task[:-1], "../" + task, task + "' OR '1'='1", "%", "x" * 5000, "\n",
                      "\u0001", self.prefix):
            for method in ("status", "stop"):
                outcome = self.data(method, {"id": wrong, "force": True})
                self.assertIs(outcome["done"], False, (method, wrong))
                self.assertNotEqual(0, outcome["error"], (method, wrong))
        self.assertIs(self.end_of(task)["success"], True)

    @staticmethod
    def lives(pid):
        """Whether the process is there, and no zombie that nobody has waited for yet."""
        try:
            with open(f"/proc/{pid}/stat", encoding="utf-8", errors="replace") as stat:
                return stat.read().rpartition(")")[2].split()[0] not in "ZX"
        except FileNotFoundError:
            return False


def main():
    parser = argparse.ArgumentParser(description=__doc__, formatter_class=argparse.RawDescriptionHelpFormatter)
    parser.add_argument("--call", required=True, metavar="COMMAND")
    parser.add_argument("--server", default="", metavar="COMMAND")
    options, rest = parser.parse_known_args()
    InServer.call_command = shlex.split(options.call)
    InServer.server_command = options.server
    unittest.main(argv=[sys.argv[0], *rest])


if __name__ == "__main__":
    main()
