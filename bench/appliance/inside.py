"""Runs within a host of the lab, so that no time of entering it is counted. A job comes as JSON on the input, and what
was measured goes to the output as JSON, in seconds and bytes.

{"do": "time", "commands": {NAME: {"words": [...], "environment": {...}}}, "rounds": N, "deadline": SECONDS}
    runs the commands in turn, beginning with another one each round -> {NAME: [{"seconds", "peak"}]}
{"do": "start", "words": [...], "socket": PATH, "rounds": N, "settle": SECONDS, "deadline": SECONDS}
    starts a server until it answers and ends it again -> [{"seconds", "pss", "rss", "private"}]

A command that fails or takes too long ends the job: exit code 1, and the reason in one line.
"""

import json
import os
import signal
import socket
import subprocess
import sys
import tempfile
import time

PAUSE = 0.0005


class Problem(Exception):
    pass


def limit(seconds):
    """Within this time, or Problem; 0 takes the limit away."""
    signal.setitimer(signal.ITIMER_REAL, seconds)


def on_limit(number, frame):
    raise Problem("took too long")


def time_command(words, environment):
    with tempfile.TemporaryFile() as errors:
        begin = time.perf_counter()
        process = subprocess.Popen(words, stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL, stderr=errors,
                                   env={**os.environ, **environment}, start_new_session=True)
        try:
            _, status, usage = os.wait4(process.pid, 0)
        except Problem:
            os.killpg(process.pid, signal.SIGKILL)
            raise
        seconds = time.perf_counter() - begin
        process.returncode = os.waitstatus_to_exitcode(status)
        if process.returncode != 0:
            errors.seek(0)
            text = errors.read().decode(errors="backslashreplace").strip()
            raise Problem(f"ended with code {process.returncode}: {text[-500:]}")
    return {"seconds": seconds, "peak": usage.ru_maxrss * 1024}


def time_commands(job):
    names = list(job["commands"])
    measured = {name: [] for name in names}
    for turn in range(job["rounds"]):
        for place in range(len(names)):
            name = names[(turn + place) % len(names)]
            command = job["commands"][name]
            limit(job["deadline"])
            try:
                measured[name].append(time_command(command["words"], command.get("environment", {})))
            except Problem as problem:
                raise Problem(f"{name}: {problem}") from None
            finally:
                limit(0)
    return measured


def answers(path):
    try:
        with socket.socket(socket.AF_UNIX, socket.SOCK_STREAM) as connection:
            connection.connect(path)
            connection.sendall(b"GET /webapi HTTP/1.1\r\nHost: localhost\r\nConnection: close\r\n\r\n")
            return connection.recv(4096).startswith(b"HTTP/1.1 200 ")
    except (FileNotFoundError, ConnectionError):
        return False


def memory(pid):
    """In bytes; "pss" counts a page that several processes use as a part of one."""
    kinds = {"Pss": 0, "Rss": 0, "Private_Clean": 0, "Private_Dirty": 0}
    with open(f"/proc/{pid}/smaps_rollup", encoding="ascii") as lines:
        for line in lines:
            name, _, rest = line.partition(":")
            if name in kinds:
                kinds[name] = int(rest.split()[0]) * 1024
    return {"pss": kinds["Pss"], "rss": kinds["Rss"], "private": kinds["Private_Clean"] + kinds["Private_Dirty"]}


def start(job):
    begin = time.perf_counter()
    process = subprocess.Popen(job["words"], stdin=subprocess.DEVNULL, stdout=subprocess.DEVNULL,
                               stderr=subprocess.DEVNULL, start_new_session=True)
    try:
        limit(job["deadline"])
        while not answers(job["socket"]):
            if process.poll() is not None:
                raise Problem(f"ended with code {process.returncode}")
            time.sleep(PAUSE)
        seconds = time.perf_counter() - begin
        limit(0)
        time.sleep(job["settle"])
        measured = {"seconds": seconds, **memory(process.pid)}
        process.terminate()
        limit(job["deadline"])
        process.wait()
        return measured
    except Problem:
        process.kill()
        process.wait()
        raise
    finally:
        limit(0)


def main():
    job = json.load(sys.stdin)
    signal.signal(signal.SIGALRM, on_limit)
    try:
        if job["do"] == "time":
            result = time_commands(job)
        else:
            result = [start(job) for _ in range(job["rounds"])]
    except Problem as problem:
        sys.exit(str(problem))
    json.dump(result, sys.stdout)


main()
