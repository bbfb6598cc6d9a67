"""The figures that are wanted, and whether the measured ones meet them."""

import math

from callgrind import own_total

GET_NANOSECONDS = 10_000
ENTRY_NANOSECONDS = 400
DOMAIN_LIST_2_NANOSECONDS = 1_200
LIBRARY_BYTES = 150_000
# Instructions have no noise: how much more an entry may take among 100,000 than among 1,000, for n log n.
GROWTH = math.log(100_000) / math.log(1_000)
# A shared machine's times vary; what is missed by less than this is reported but fails nothing.
MARGIN = 2.0


# Of the interfaces in the file only the first 127 bytes are read, so an entry's time shows in a short list alone.
CUT_LIST = "nics from the file, get"
CUT_LIST_USUAL = ("get, member", 2)  # the same operation with this many entries


def list_names(instructions):
    return [name for name, length in instructions if length == 1000]


def entry_nanoseconds(times, name):
    """The greater of an entry's times in a list of 1,000 and of 100,000."""
    lengths = times.lists[name]
    if name == CUT_LIST:
        usual, count = CUT_LIST_USUAL
        return (lengths[10].own_nanoseconds() - times.operations[usual].own_nanoseconds()) / (10 - count)
    return max(lengths[length].own_nanoseconds() / length for length in (1000, 100000))


def figures(times, instructions, library_bytes):
    """Rows of (what, measured, wanted, unit)."""
    get = times.operations["get, member"].own_nanoseconds()
    rows = [("get, beside its platform calls", get, GET_NANOSECONDS, "ns")]
    names = list_names(instructions)
    for name in names:
        limit = DOMAIN_LIST_2_NANOSECONDS if name.startswith("domain list 2") else ENTRY_NANOSECONDS
        rows.append((f"{name}: an entry", entry_nanoseconds(times, name), limit, "ns"))
    for name in names:
        few = own_total(instructions[(name, 1000)]) / 1000
        many = own_total(instructions[(name, 100000)]) / 100000
        rows.append((f"{name}: growth", many / few, GROWTH, "times"))
    rows.append(("stripped library", library_bytes, LIBRARY_BYTES, "bytes"))
    return rows


def verdict(measured, limit):
    if measured <= limit:
        return "met"
    return "missed" if measured <= MARGIN * limit else "MISSED BY FAR"
