"""Runs the tests on one mutant after the other."""

import json
import os
import re
import signal
import subprocess
import tempfile
import time
from concurrent.futures import ThreadPoolExecutor
from dataclasses import dataclass, field
from pathlib import Path

KILLED, TIMED_OUT, SURVIVED, NOT_REACHED, REFUSED = "killed", "timed out", "survived", "not reached", "refused"
SHORTEST_TIMEOUT = 5  # seconds
TIMES_AS_LONG = 10
NO_MUTANT = (1 << 15) - 1  # a number that a mutant could have, and none has
FIRST_FEW = 12  # tests that are tried ahead of a long list


class TestsFail(Exception):
    pass


@dataclass
class Test:
    target: str
    name: str
    milliseconds: int
    reaches: frozenset


@dataclass
class Program:
    target: str
    path: Path
    startup: float = 0  # seconds that aren't any test's
    tests: list = field(default_factory=list)
    before_tests: frozenset = frozenset()  # mutants that are reached ahead of the first test


class Runner:
    def __init__(self, build, jobs):
        self.jobs = jobs
        self.programs = {target: Program(target, build.executable(target)) for target in build.targets}
        self.memory = build.folder / "killers.json"  # which test killed a mutant last time: it's tried first
        self.killers = json.loads(self.memory.read_text()) if self.memory.exists() else {}

    # ---- the clean run ----

    def record(self):
        """Runs all tests with no mutant on, and notes how long they take and which mutants each of them reaches."""
        for program in self.programs.values():
            with tempfile.TemporaryDirectory() as folder:
                notes = Path(folder) / "reached"
                self.run_clean(program, {"MUTANT_RECORD": str(notes)})
                before, *lines = [line.split() for line in notes.read_text().splitlines()]
            began = time.monotonic()
            self.run_clean(program, {"MUTANT": str(NO_MUTANT)})
            elapsed = time.monotonic() - began
            program.before_tests = frozenset(map(int, before[2:]))
            program.tests = [Test(program.target, name, int(milliseconds), frozenset(map(int, numbers)))
                             for name, milliseconds, *numbers in lines]
            program.startup = max(0, elapsed - sum(test.milliseconds for test in program.tests) / 1000)

    def run_clean(self, program, settings):
        passed, output = self.run(program, None, timeout=600, settings=settings)
        if not passed:
            failures = [line for line in output.splitlines() if not line.startswith(("[  SKIPPED", "[       OK"))]
            raise TestsFail("\n".join(failures[-60:] + [f"{program.target} fails without a mutant"]))

    # ---- one mutant ----

    def judge(self, mutant):
        """What became of the mutant, and the test that noticed it."""
        reaching = self.reaching(mutant.number)
        if not reaching and not mutant.rebuilt and not self.is_reached_early(mutant.number):
            return NOT_REACHED, ""
        tried = set()
        for tests in self.rounds(mutant, reaching):
            fresh = [test for test in tests if (test.target, test.name) not in tried]
            tried.update((test.target, test.name) for test in fresh)
            for program in self.programs.values():
                own = [test for test in fresh if test.target == program.target]
                if not own:
                    continue
                verdict, killer = self.try_tests(program, mutant.number, own)
                if verdict != SURVIVED:
                    self.killers[mutant.key] = [program.target, killer]
                    return verdict, killer
        return SURVIVED, ""

    def reaching(self, number):
        return [test for program in self.programs.values() for test in program.tests if number in test.reaches]

    def is_reached_early(self, number):
        return any(number in program.before_tests for program in self.programs.values())

    def rounds(self, mutant, reaching):
        """Lists of tests to try, the promising ones first."""
        every = [test for program in self.programs.values() for test in program.tests]
        last_time = self.killers.get(mutant.key)
        yield [test for test in every if [test.target, test.name] == last_time]
        if len(reaching) > 2 * FIRST_FEW:
            yield sorted(reaching, key=lambda test: (test.milliseconds, len(test.reaches)))[:FIRST_FEW]
        yield reaching
        if mutant.rebuilt or self.is_reached_early(mutant.number):
            yield every

    def try_tests(self, program, number, tests):
        seconds = program.startup + sum(test.milliseconds for test in tests) / 1000
        names = None if len(tests) == len(program.tests) else [test.name for test in tests]
        try:
            passed, output = self.run(program, names, max(SHORTEST_TIMEOUT, TIMES_AS_LONG * seconds),
                                      {"MUTANT": str(number)})
        except subprocess.TimeoutExpired as expired:
            return TIMED_OUT, last_started(expired.output)
        return (SURVIVED, "") if passed else (KILLED, last_started(output))

    def run(self, program, names, timeout, settings):
        """Runs tests in a process group of their own; gives whether they passed, and what they wrote."""
        with tempfile.TemporaryDirectory() as folder:
            command = [str(program.path), "--gtest_fail_fast", "--gtest_color=no"]
            if names is not None:
                flags = Path(folder) / "flags"
                flags.write_text("--gtest_filter=" + ":".join(names) + "\n")
                command.append(f"--gtest_flagfile={flags}")
            environment = {name: value for name, value in os.environ.items() if not name.startswith("MUTANT")}
            environment.update(settings, TMPDIR=folder)
            process = subprocess.Popen(command, stdout=subprocess.PIPE, stderr=subprocess.STDOUT, text=True,
                                       stdin=subprocess.DEVNULL, errors="replace", env=environment, cwd=folder,
                                       start_new_session=True)
            try:
                output, _ = process.communicate(timeout=timeout)
            except subprocess.TimeoutExpired as expired:
                os.killpg(process.pid, signal.SIGKILL)
                expired.output, _ = process.communicate()
                raise
        return process.returncode == 0, output

    # ---- all of them ----

    def judge_all(self, mutants, progress):
        """The verdicts, as mutant -> (verdict, test), for mutants that are compiled in."""
        verdicts = {}
        with ThreadPoolExecutor(max_workers=self.jobs) as pool:
            for mutant, verdict in zip(mutants, pool.map(self.judge, mutants)):
                verdicts[mutant] = verdict
                progress(mutant, verdict)
        self.remember()
        return verdicts

    def remember(self):
        self.memory.write_text(json.dumps(self.killers, indent=0, sort_keys=True))


def last_started(output):
    started = re.findall(r"^\[ RUN      \] (\S+)", output or "", re.MULTILINE)
    return started[-1] if started else ""
