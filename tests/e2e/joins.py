"""A join that stands still in its middle, while something happens to whoever serves it."""

import contextlib

from client import DIRECTORY
from processes import held, programs


def steps(machine):
    return machine.client.call(DIRECTORY, 1, "join_steps").data


@contextlib.contextmanager
def under_way(machine):
    """The join's own tool stands still in its longest step, so that the join is not over before what the block does.
    Until the tool is at work the record is that of the leave before."""
    def joins():
        record = steps(machine)
        return record is not None and record["finished"] is None and "join" in [
            step["name"] for step in record["steps"]]

    machine.wait_until(joins, 20, "the join")
    # Samba's tool goes on: what it waits for has times of its own.
    with held(lambda: programs(machine, "vornjoin")) as stopped:
        assert stopped, "the join is over"
        yield


def ends_well(machine):
    machine.wait_until(lambda: steps(machine)["finished"] is not None, 60, "the end of the join")
    assert steps(machine)["success"] is True
    assert machine.client.get()["domain_name"] == "LAB" and machine.trust_works()
