#!/usr/bin/python3
"""Changes the sources in small ways, one at a time, and checks that the unit tests notice. README.md tells how."""

import argparse
import os
import sys
import time
from pathlib import Path

sys.dont_write_bytecode = True

from build import Build, BuildError  # noqa: E402
from collect import collect  # noqa: E402
from review import SURVIVED, read_reviewed, report, show  # noqa: E402
from runner import REFUSED, Runner, TestsFail  # noqa: E402

ROOT = Path(__file__).resolve().parents[2]
SURVIVORS = ROOT / "tests" / "mutation" / "survivors.txt"


def arguments():
    parser = argparse.ArgumentParser(description=__doc__)
    parser.add_argument("--only", metavar="FILE", action="append", help="mutants of this source file; may be repeated")
    parser.add_argument("--list", action="store_true", help="list the mutants and run nothing")
    parser.add_argument("--mutant", metavar="N", type=int, help="run this one and show what the tests say")
    parser.add_argument("--jobs", metavar="N", type=int, default=os.cpu_count(), help="processes at a time")
    return parser.parse_args()


def selected(files, only):
    if not only:
        return [mutant for places in files for mutant in places.mutants]
    paths = {str(Path(name).resolve().relative_to(ROOT)) if Path(name).exists() else name for name in only}
    unknown = paths - {places.source.path for places in files}
    if unknown:
        raise SystemExit(f"no such source file: {', '.join(sorted(unknown))}")
    return [mutant for places in files if places.source.path in paths for mutant in places.mutants]


class Progress:
    """A line now and then."""

    def __init__(self, total):
        self.total = total
        self.done = 0
        self.began = self.shown = time.monotonic()

    def __call__(self, mutant, verdict):
        self.done += 1
        now = time.monotonic()
        if now - self.shown >= 20 or self.done == self.total:
            self.shown = now
            print(f"{self.done} of {self.total} mutants after {now - self.began:.0f} s", flush=True)


def judge_rebuilt(build, runner, mutants, progress):
    """Mutants in constant expressions: each is compiled in, tested, and taken out again."""
    verdicts = {}
    files = {places.source.path: places for places in build.files}
    for mutant in mutants:
        places = files[mutant.path]
        verdicts[mutant] = runner.judge(mutant) if build.compiles_with(places, mutant) else (REFUSED, "")
        build.write_file(places)
        progress(mutant, verdicts[mutant])
    if mutants:
        build.compile()
        runner.remember()
    return verdicts


def run_one(build, runner, mutant):
    show(mutant, build)
    if mutant.rebuilt:
        verdict, test = judge_rebuilt(build, runner, [mutant], lambda *_: None)[mutant]
    else:
        verdict, test = runner.judge(mutant)
        if test:
            program = runner.programs[runner.killers[mutant.key][0]]
            print(runner.run(program, [test], 60, {"MUTANT": str(mutant.number)})[1])
    print(f"{verdict} {test}".strip())
    return 0 if verdict != SURVIVED else 1


def main():
    options = arguments()
    os.nice(5)
    files = collect(ROOT)
    mutants = selected(files, options.only)
    if options.list:
        for mutant in mutants:
            print(f"{mutant.number}\t{mutant.place}\t{mutant.key}{' (rebuilt)' if mutant.rebuilt else ''}")
        return 0

    build = Build(ROOT, files, options.jobs)
    build.write()
    build.configure()
    build.compile()
    runner = Runner(build, options.jobs)
    runner.record()
    if options.mutant is not None:
        every = {mutant.number: mutant for places in files for mutant in places.mutants}
        return run_one(build, runner, every[options.mutant])

    progress = Progress(len(mutants))
    verdicts = runner.judge_all([mutant for mutant in mutants if not mutant.rebuilt], progress)
    verdicts.update(judge_rebuilt(build, runner, [mutant for mutant in mutants if mutant.rebuilt], progress))
    paths = {mutant.path for mutant in mutants}
    reviewed = {key: reason for key, reason in read_reviewed(SURVIVORS).items()
                if key.partition(": ")[0] in paths or not options.only}
    return report({mutant: verdicts[mutant] for mutant in mutants}, reviewed, build)


if __name__ == "__main__":
    try:
        sys.exit(main())
    except (BuildError, TestsFail) as error:
        print(error, file=sys.stderr)
        sys.exit(2)
