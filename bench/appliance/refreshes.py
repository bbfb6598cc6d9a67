"""A refresh of thousands of users and their groups against bare searches of the same attributes, and its memory."""

import re
import time

from client import DIRECTORY
from figures import Values
from machine import CONFIGURATION, NETBIOS, Wrong, lab_with
from peaks import Peaks

SIZES = (10_000, 20_000)
GROUPS = 1_000  # of the lab's bulk mode
TIMES = 1.3
GROWTH_PERCENT = 5
PAUSE = 0.01
DEADLINE = 300
MEMORY_RUNS = 3
# What appliance/domain/directory asks for.
ATTRIBUTES = ["sAMAccountName", "displayName", "cn", "objectSid"]
SEARCHES = {
    "users": "(sAMAccountType=805306368)",
    "groups": "(&(objectClass=group)(!(groupType:1.2.840.113556.1.4.803:=1)))",
}


def refresh(machine):
    """Seconds of the whole refresh, from the call to the task's end."""
    begin = time.perf_counter()
    task = machine.client.start_refresh(NETBIOS).data["task_id"]
    while True:
        answer = machine.client.refresh_status(task)
        if not answer.ok:
            raise Wrong(f"the refresh failed: {answer.body}\n{machine.syslog()[-2000:]}")
        if answer.data and answer.data["status"] == "finish":
            return time.perf_counter() - begin
        if time.perf_counter() - begin > DEADLINE:
            raise Wrong(f"the refresh did not end within {DEADLINE} s")
        time.sleep(PAUSE)


def logged(machine, kind):
    """What the appliance's log says that the last fetch of this kind took, in seconds."""
    return int(re.findall(rf"{NETBIOS}: \d+ {kind} from \S+ in (\d+) ms", machine.syslog())[-1]) / 1000


def check_lists(machine, users):
    for kind, least in (("users", users), ("groups", GROUPS)):
        total = machine.client.call(DIRECTORY, 1, kind, {"domain": NETBIOS, "offset": 0, "limit": 1}).data["total"]
        if not least < total < least + 100:
            raise Wrong(f"{total} {kind} were fetched instead of {least} and a few")


def search(machine):
    """Seconds of a bare search, for users and for groups."""
    environment = {"LC_ALL": "C"}
    net = ["net", f"--configfile={CONFIGURATION}", "ads", "search", "-P"]
    commands = {kind: {"words": [*net, expression, *ATTRIBUTES], "environment": environment}
                for kind, expression in SEARCHES.items()}
    measured = machine.time(commands, rounds=1, deadline=DEADLINE)
    return {kind: runs[0] for kind, runs in measured.items()}


def measure_size(machine, users, findings, details, options, say):
    """Answers the peaks of the memory of refreshes."""
    machine.join()
    refresh(machine)
    check_lists(machine, users)
    search(machine)
    whole, fetches, searches = [], [], []
    for turn in range(options.runs):
        for side in ("refresh", "search") if turn % 2 == 0 else ("search", "refresh"):
            if side == "search":
                searches.append(search(machine))
            else:
                whole.append(refresh(machine))
                fetches.append({kind: logged(machine, kind) for kind in SEARCHES})
    bare = [run["users"]["seconds"] + run["groups"]["seconds"] for run in searches]
    findings.add(f"refresh of {users:,} users, against `net ads search -P`",
                 Values([one / other for one, other in zip(whole, bare)], "times"), TIMES)
    details.add(f"{users:,} users: refresh, from the call to its end", Values(whole, "s"))
    for kind in SEARCHES:
        details.add(f"{users:,} users: of it, fetch of the {kind}", Values([run[kind] for run in fetches], "s"))
    details.add(f"{users:,} users: both searches", Values(bare, "s"))
    for kind in SEARCHES:
        details.add(f"{users:,} users: of it, search of the {kind}",
                    Values([run[kind]["seconds"] for run in searches], "s"))
    details.add(f"{users:,} users: memory of the search, most",
                Values([run["users"]["peak"] for run in searches], "MB"))
    say(f"{users:,} users: {Values(whole, 's').median:.2f} s refresh, {Values(bare, 's').median:.2f} s searches")

    peaks = []
    for _ in range(MEMORY_RUNS):
        with Peaks(machine) as watched:
            refresh(machine)
        peaks.append(watched.highest)
    details.add(f"{users:,} users: memory of the refresh, most", Values(peaks, "MB"))
    return peaks


def measure(stage, findings, options, say):
    """In labs of its own."""
    details = findings.table_of(f"A refresh of one domain, with {GROUPS:,} groups", "what")
    peaks = {}
    for users in SIZES:
        say(f"a domain of {users:,} users; the first time takes some minutes, then it is kept")
        with lab_with(stage, "--bulk", users) as machine:
            machine.start()
            peaks[users] = measure_size(machine, users, findings, details, options, say)
    few, many = (sorted(peaks[users]) for users in SIZES)
    ratios = [high / low for low, high in zip(few, many)]
    findings.add(f"memory of a refresh of {SIZES[1]:,} users, above that of {SIZES[0]:,}",
                 Values([100 * (ratio - 1) for ratio in ratios], "%"), GROWTH_PERCENT)
