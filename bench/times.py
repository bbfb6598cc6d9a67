"""Runs the benchmarks program: time and allocations of every case, and the fit of the list cases."""

import json
import subprocess

LENGTHS = (10, 1000, 100000)


class Figure:
    """One case at one length: nanoseconds and allocations of the call and of its platform calls."""

    def __init__(self):
        self.nanoseconds = {}
        self.allocations = {}

    def own_nanoseconds(self):
        return self.nanoseconds["call"] - self.nanoseconds["platform"]

    def own_allocations(self):
        return self.allocations["call"] - self.allocations["platform"]


class Times:
    def __init__(self):
        self.operations = {}  # name -> Figure
        self.lists = {}  # name -> {length -> Figure}
        self.fits = {}  # name -> the fitted complexity of the call

    def add(self, run):
        kind, name = run["run_name"].split("|")
        side = kind.split(" ")[-1]
        if kind.startswith("list "):
            if run["aggregate_name"] == "BigO":
                if side == "call":
                    self.fits[name] = run["big_o"].strip("()")
                return
            name, length = name.rsplit("/", 1)
            figure = self.lists.setdefault(name, {}).setdefault(int(length), Figure())
        else:
            figure = self.operations.setdefault(name, Figure())
        if run["aggregate_name"] == "median":
            # The processor's time and not the clock's: other processes share the machine.
            figure.nanoseconds[side] = run["cpu_time"]
            figure.allocations[side] = run["allocations"]


def measure(program, results, repetitions, seconds):
    out = results / "times.json"
    command = [
        str(program),
        f"--benchmark_out={out}",
        "--benchmark_out_format=json",
        f"--benchmark_repetitions={repetitions}",
        f"--benchmark_min_time={seconds}",
        "--benchmark_report_aggregates_only=true",
        "--benchmark_enable_random_interleaving=true",
    ]
    with open(results / "times.txt", "w", encoding="utf-8") as log:
        subprocess.run(command, check=True, stdout=log, stderr=subprocess.STDOUT)
    times = Times()
    for run in json.loads(out.read_text(encoding="utf-8"))["benchmarks"]:
        if run["run_type"] == "aggregate" and run["aggregate_name"] in ("median", "BigO"):
            times.add(run)
    return times
