"""Passwords: of the account that joins and of the machine itself. They are in no list of processes, no file, no log and
no answer but where they must be, whether a join succeeds, fails or is killed."""

import contextlib
import json
import re
import signal
import threading
import time

import pytest

from canary import SECRETS, Answers, Canary, Sampler, check_programs, files_written, machine_password, spellings, where
from client import DIRECTORY, DOMAIN
from door import Door
from exec_watch import ExecWatch
from kills import Call, Steps
from obstacles import replaced
from processes import held, programs


@pytest.fixture
def canary(lab):
    """An account of LAB.TEST, for now without any right."""
    made = Canary()
    result = lab.exec("dc1", "samba-tool", "user", "create", "canary", made.text, deadline=60)
    assert result.code == 0, result
    yield made
    lab.exec("dc1", "samba-tool", "user", "delete", "canary", deadline=60)


def give_rights(lab):
    result = lab.exec("dc1", "samba-tool", "group", "addmembers", "Domain Admins", "canary", deadline=60)
    assert result.code == 0, result


def fail_at_every_step(machine, lab, canary, answers):
    """The password goes along as a right and as a wrong one; the account has no right to join."""
    for user, more, code in [
        ("Administrator", {}, 2607),  # credentials: a wrong password
        ("nobody-here", {}, 2607),
        ("canary", {}, 2611),  # join: a right one, without the right to join
        ("canary", {"advance_domain_conf": {"enable_advance_option": True, "netbios_name": "WRONGWG"}}, 2604),
    ]:
        assert answers.join("lab.test", user, canary.text, **more).code == code, machine.ctl("steps").text
    assert answers.join("nowhere.test", "canary", canary.text).code == 2605
    assert answers.join("NT4DOM", "Administrator", canary.text).code in (2607, 2610, 2611)
    with lab.fault("smb-rst", "dc1", only=machine.host):
        assert answers.join("lab.test", "canary", canary.text).code == 2606
    # Refused before anything begins.
    for wrong in ([canary.text], {"x": canary.text}):
        answer = answers.keep(machine.client.call(DOMAIN, 1, "set", {
            "enable_domain": True, "domain_name": "lab.test", "username": "canary", "password": wrong}))
        assert answer.code == 2618
    body = json.dumps({"password": canary.text}).encode()
    assert answers.raw(f"/webapi/{DOMAIN}/1/set", body[:-1]) == 400
    assert answers.raw(f"/webapi/{DOMAIN}/1/nothing", body) == 404
    result = answers.ctl("join", "lab.test", "--user", "canary", "--password-stdin", input=canary.text + "x\n")
    assert result.code == 1, result


def join_and_ignore(machine, canary):
    with contextlib.suppress(ConnectionError, TimeoutError):
        machine.client.join("lab.test", "canary", canary.text)


def crash(machine, canary, name):
    """Joins, and has a program of the join end as after a fault of its own, which would leave its memory behind."""
    machine.must("sh", "-c", "prlimit --core=unlimited --pid $(pgrep -o -x vornd)")
    call = threading.Thread(target=join_and_ignore, args=(machine, canary), daemon=True)
    call.start()
    machine.wait_until(lambda: [process for process in programs(machine, "net") if "join" in process.arguments], 30,
                       "the join's tool")
    for process in programs(machine, name):
        process.signal(signal.SIGSEGV)
    call.join(60)
    assert not call.is_alive()


def test_the_password_is_nowhere(appliance, lab, canary):
    since = time.time() - 20
    answers = Answers(appliance)
    with Sampler(appliance) as sampler:
        fail_at_every_step(appliance, lab, canary, answers)
        give_rights(lab)
        for name in ("net", "vornjoin"):
            crash(appliance, canary, name)
        assert answers.join("lab.test", "canary", canary.text).ok, appliance.ctl("steps").text
        assert appliance.client.test_dc() is True
        assert appliance.client.refresh().ok
        result = answers.ctl("join", "lab.test", "--user", "canary", "--password-stdin", input=canary.text + "\n")
        assert result.code == 0, result
        own = machine_password(appliance)
        assert where(appliance, since, own) == [SECRETS]
        wrong = answers.keep(appliance.client.call(DIRECTORY, 1, "leave", {
            "delete_account": True, "username": "Administrator", "password": canary.text}))
        assert not wrong.ok
        for method, words in (("join_steps", {}), ("users", {"offset": 0, "limit": 1000})):
            answers.keep(appliance.client.call(DIRECTORY, 1, method, words))
        left = answers.keep(appliance.client.call(DIRECTORY, 1, "leave", {
            "delete_account": True, "username": "canary", "password": canary.text}))
        assert left.ok, left.body
        answers.ctl("steps")
        answers.ctl("events")
    assert where(appliance, since, own) == []
    assert where(appliance, since, canary.middle) == []
    assert answers.holding(canary.middle) == []
    assert answers.holding(own) == []
    # It looked often enough to see what lives for some milliseconds.
    assert sampler.passes / sampler.seconds > 20
    assert "net" in sampler.check(canary.middle)
    assert sampler.check(own) == set()
    cores = [path for path, _ in files_written(appliance, since) if re.search(r"/core(\.\d+)?$", path)]
    assert cores == []


def server(machine):
    return next(process for process in programs(machine, "vornd") if process.arguments[1:2] != ["--task"])


def steps_begun(steps):
    """Of a join that came after these steps were looked for."""
    record = steps.read()
    return [] if record.get("id") in (None, steps.before) else [step["name"] for step in record["steps"]]


def test_every_program_that_a_join_begins(appliance, lab, canary):
    """None lives too briefly to be seen: each is stopped before its first instruction. And amid the steps that know the
    password no file holds it."""
    give_rights(lab)
    since = time.time() - 20
    with ExecWatch(server(appliance)) as watch:
        for step, name in (("credentials", "vornjoin"), ("join", "net")):
            steps = Steps(appliance)
            call = Call(appliance.client.join, "lab.test", "canary", canary.text)
            with contextlib.ExitStack() as stopped:
                # Of a controller near by, the first of these steps would be over before it is seen.
                with lab.fault("slow", "dc1", only=appliance.host) if name == "vornjoin" else contextlib.nullcontext():
                    appliance.wait_until(lambda: step in steps_begun(steps) and programs(appliance, name), 30, step)
                    stopped.enter_context(held(lambda: programs(appliance, "vornjoin", "net", "timeout")))
                assert steps_begun(steps)[-1] == step
                assert where(appliance, since, canary.middle) == []
            answer = call.wait()
        # The first one may have stood still for longer than its step has time.
        assert answer.ok, appliance.ctl("steps").text
        own = machine_password(appliance)
        left = appliance.client.call(DIRECTORY, 1, "leave", {
            "delete_account": True, "username": "canary", "password": canary.text})
        assert left.ok, left.body
    names = [program["arguments"][0].rpartition("/")[2] for program in watch.begun if program["arguments"]]
    assert names.count("vornjoin") == 3 and names.count("net") >= 4, names
    assert "net" in check_programs(watch.begun, canary.middle)
    assert check_programs(watch.begun, own) == set()


@pytest.fixture
def nt4_canary(lab):
    """An account of NT4DOM that may join."""
    made = Canary()
    script = """set -e
        useradd --no-create-home --home-dir /nonexistent --shell /usr/sbin/nologin --gid domusers -G domadmins canary
        cat | smbpasswd -s -a canary"""
    result = lab.exec("pdc", "sh", "-c", script, input=f"{made.text}\n{made.text}\n", deadline=30)
    assert result.code == 0, result
    yield made
    lab.exec("pdc", "sh", "-c", "smbpasswd -x canary; userdel canary", deadline=30)


# Samba's tool, but that it waits before it joins, and says so.
WAITING = """cat >"$1" <<'SCRIPT'
#!/bin/bash
if [[ " $* " == *" join "* ]]; then
    echo "$$" >/tmp/waiting
    while [ ! -e /tmp/go ]; do PASSWD= sleep 0.02; done
fi
exec -a net /usr/bin/net.kept "$@"
SCRIPT
"""


def test_a_join_of_the_old_style_through_the_door(appliance, nt4_canary):
    since = time.time() - 20
    door = Door(appliance)
    door.start()
    try:
        visitor = door.login()
        answers = []
        call = threading.Thread(daemon=True, target=lambda: answers.append(visitor.call(DOMAIN, 1, "set", {
            "enable_domain": True, "domain_name": "NT4DOM", "username": "canary", "password": nt4_canary.text})))
        with replaced(appliance, "/usr/bin/net", WAITING), ExecWatch(server(appliance)) as watch:
            call.start()
            appliance.wait_until(lambda: appliance.exists("/tmp/waiting"), 30, "the join's tool")
            assert where(appliance, since, nt4_canary.middle) == []
            appliance.write("/tmp/go", "")
            appliance.wait_until(lambda: programs(appliance, "net.kept") or not call.is_alive(), 30, "its work")
            with held(lambda: programs(appliance, "net.kept", "vornjoin")):
                assert where(appliance, since, nt4_canary.middle) == []
            call.join(60)
        record = appliance.client.call(DIRECTORY, 1, "join_steps").data
        assert answers and answers[0].ok, record["steps"]
        seen = check_programs([program for program in watch.begun if program["program"] != "/usr/bin/bash"],
                              nt4_canary.middle)
        assert {"net.kept", "rpcclient"} <= seen, seen
        assert where(appliance, since, nt4_canary.middle) == []
        assert nt4_canary.middle not in json.dumps(answers[0].body) + json.dumps(record) + door.log()
    finally:
        door.end()


def test_what_is_looked_for_would_be_found(appliance, canary):
    """The sampler and the search are worth something: they find a password that is where it must not be."""
    since = time.time() - 20
    with Sampler(appliance) as sampler:
        appliance.must("sh", "-c", "sleep 0.5; echo", "sh", canary.text)
    with pytest.raises(AssertionError, match="in the arguments"):
        sampler.check(canary.middle)
    with Sampler(appliance) as sampler:
        appliance.must("sleep", "0.5", env={"PASSWD": canary.text})
    with pytest.raises(AssertionError, match="in the environment"):
        sampler.check(canary.middle)
    for number, content in enumerate(sorted(spellings(canary.middle))):
        path = f"/var/lib/vorn/{number}"
        appliance.write(path, b"before" + content + b"after")
        assert where(appliance, since, canary.middle) == [path]
        appliance.must("rm", path)
