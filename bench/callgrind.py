"""Runs the instructions program under callgrind: instructions of every case, by the library that executes them."""

import os
import re
import subprocess

MEASURED = "MeasuredCall"
NAMED = re.compile(r"\((\d+)\)(?: (.*))?$")


def library(path, program):
    if path == program:
        return "module"
    return "jsoncpp" if "jsoncpp" in path else "system"


def read_dump(path, names, program):
    """Sums the instructions of one dump by library. `names` carries the abbreviations of object files."""
    sums = {"module": 0, "jsoncpp": 0, "system": 0}
    current = None
    skip = False
    with open(path, encoding="utf-8", errors="replace") as dump:
        for line in dump:
            line = line.rstrip("\n")
            if line.startswith(("ob=", "cob=")):
                key, name = NAMED.match(line.split("=", 1)[1]).groups()
                if name:
                    names[key] = name
                if line.startswith("ob="):
                    current = library(names[key], program)
            elif line.startswith("calls="):
                skip = True  # the next line is what was called, which is listed where it belongs
            elif line[:1] in "+-*0123456789" and line:
                if not skip:
                    sums[current] += int(line.split()[1])
                skip = False
    return sums


def measure(program, results):
    """{(name, length): {"call": sums, "platform": sums}}"""
    for old in results.glob("callgrind.out*"):
        old.unlink()
    out = results / "callgrind.out"
    command = [
        "valgrind",
        "--tool=callgrind",
        f"--toggle-collect={MEASURED}",
        f"--dump-after={MEASURED}",
        f"--callgrind-out-file={out}",
        str(program),
    ]
    # The loader's look-ups are the process's, not a call's.
    environment = dict(os.environ, LD_BIND_NOW="1")
    with open(results / "callgrind.txt", "w", encoding="utf-8") as log:
        run = subprocess.run(command, check=True, stdout=subprocess.PIPE, stderr=log, env=environment, text=True)
    figures = {}
    names = {}
    for part, line in enumerate(run.stdout.splitlines(), start=1):
        name, length, side = line.split("|")
        sums = read_dump(f"{out}.{part}", names, str(program))
        figures.setdefault((name, int(length)), {})[side] = sums
    return figures


def own(figure):
    return {key: figure["call"][key] - figure["platform"][key] for key in figure["call"]}


def own_total(figure):
    return sum(own(figure).values())
