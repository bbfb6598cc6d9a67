"""The tables by which the page's rules are tested, sent to the modules: they refuse what the tables say they refuse."""

import json
from pathlib import Path

import pytest

from appliance import Appliance
from client import CONF, DOMAIN, SCHEDULE

TABLES = Path(__file__).resolve().parent.parent / "console-rules"
NEVER = {"date_type": 2}
REFUSED_PARAMETERS = (2618, 2601)


def vectors(name):
    table = json.loads((TABLES / f"{name}.json").read_text(encoding="utf-8"))["vectors"]
    assert any(vector["code"] is None for vector in table) and any(vector["code"] for vector in table)
    return table


def code_of(machine, api, parameters):
    answer = machine.client.call(api, 1, "set", parameters)
    assert answer.status == 200, (parameters, answer.status, answer.body)
    return None if answer.ok else answer.code


@pytest.fixture(scope="module")
def member(joined):
    return joined


def test_options(member):
    before = member.client.options()
    try:
        for vector in vectors("options"):
            parameters = vector["parameters"]
            last = member.client.options()
            assert code_of(member, CONF, parameters) == vector["code"], vector
            now = member.client.options()
            if vector["code"] is not None:
                assert now == last, vector
            elif vector.get("page") == "refused":
                # That is why the page refuses it: it is stored, but counts as 1.
                assert now == {**last, "domain_nested_group": 1}, vector
            else:
                assert now == {**last, **{key: value for key, value in parameters.items() if key in last}}, vector
    finally:
        member.client.options(**before)


def test_schedule(member):
    assert member.client.schedule() == NEVER
    try:
        for vector in vectors("schedule"):
            parameters = vector["parameters"]
            last = member.client.schedule()
            assert code_of(member, SCHEDULE, parameters) == vector["code"], vector
            now = member.client.schedule()
            if vector["code"] is not None:
                assert now == last, vector
            elif parameters["date_type"] == 2:
                assert now == NEVER, vector
            else:
                absent = {"date": "", "week_name": "", "repeat": 0, "repeat_hour": 0, "last_work_hour": 0}
                assert now == {**absent, **parameters}, vector
    finally:
        member.client.schedule(**NEVER)


def test_schedule_in_words(member):
    """vornctl and the page say the same about a schedule."""
    table = json.loads((TABLES / "schedule-words.json").read_text(encoding="utf-8"))["vectors"]
    assert len(table) > 10
    try:
        for vector in table:
            member.client.schedule(**vector["schedule"])
            said = member.ctl("schedule")
            assert said.code == 0 and " ".join(said.out.split()).startswith(vector["words"]), (vector, said)
    finally:
        member.client.schedule(**NEVER)


def test_join(lab):
    machine = Appliance(lab, "nas2")
    machine.renew()
    before = machine.configuration()
    for vector in vectors("join"):
        code = code_of(machine, DOMAIN, vector["parameters"])
        if vector["code"] is None:
            assert code is not None and code not in REFUSED_PARAMETERS, (vector, code)
        else:
            assert code == vector["code"], (vector, code)
    assert machine.client.get() == {"enable_domain": False}
    assert machine.configuration() == before
