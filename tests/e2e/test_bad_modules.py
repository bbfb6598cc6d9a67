"""Files among the modules that are none: each is named in the log with the reason, and the others are served."""

import signal
import threading

import pytest

from appliance import Appliance
from client import DIRECTORY, DOMAIN, EVENTS
from obstacles import Log, away
from processes import held, loggers

FOLDER = "/usr/vorn/lib/modules"
FIRST = f"{FOLDER}/vorn_directory_domain.so"
SECOND = f"{FOLDER}/appliance_directory.so"
VORND = "/usr/vorn/sbin/vornd"

# How the file comes about, its name as "$1"; what the log says of it.
NO_MODULES = {
    "text": ('seq 1000 >"$1"', "invalid ELF header"),
    "empty": (': >"$1"', "file too short"),
    "wrong_class": (f'cp {SECOND} "$1"; printf "\\001" | dd of="$1" bs=1 seek=4 conv=notrunc status=none',
                    "wrong ELF class: ELFCLASS32"),
    "wrong_machine": (f'cp {SECOND} "$1"; printf "\\050" | dd of="$1" bs=1 seek=18 conv=notrunc status=none',
                      "it is made for another kind of processor"),
    "cut": (f'head -c 3000 {SECOND} >"$1"', "it is cut short"),
    "program": ('cp /bin/true "$1"', "cannot dynamically load position-independent executable"),
    "library": ('cp /lib/x86_64-linux-gnu/libc.so.6 "$1" 2>/dev/null || cp /lib/*/libm.so.6 "$1"',
                "it is no web-API module, for it has no GetAPITable()"),
    "not_roots": (f'cp {SECOND} "$1"; chown nobody "$1"', "does not belong to root"),
    "writable": (f'cp {SECOND} "$1"; chmod 0757 "$1"', "is writable by others than root"),
    "group_writable": (f'cp {SECOND} "$1"; chmod 0775 "$1"', "is writable by others than root"),
    "fifo": ('mkfifo "$1"', "it is no regular file"),
    "folder": ('mkdir "$1"', "it is no regular file"),
    "device": ('mknod "$1" c 1 5', "it is no regular file"),
    "dangling": ('ln -s /nowhere.so "$1"', "No such file or directory"),
    "link_to_tmp": (f'mkdir -m 777 /tmp/open; cp {SECOND} /tmp/open/x.so; ln -s /tmp/open/x.so "$1"',
                    "/tmp/open is writable by others than root"),
    "twin": (f'cp {SECOND} "$1"', "is served by another module"),
}
# A library that needs what nobody has, made without a compiler: a symbol of the second module is given another name.
UNKNOWN_SYMBOL = """
import sys
library = open(sys.argv[1], "rb").read()
old, new = b"VLIBCFileRemoveKey\\0", b"VLIBCFileRemoveKex\\0"
assert old in library
open(sys.argv[2], "wb").write(library.replace(old, new))
"""


@pytest.fixture(scope="module")
def machine(lab):
    machine = Appliance(lab, "nas1")
    machine.renew()
    return machine


def test_what_is_no_module_is_named_and_left_out(machine):
    machine.stop()
    for name, (command, _) in NO_MODULES.items():
        machine.must("sh", "-c", command, "make", f"{FOLDER}/z_{name}.so")
    symbol = f"{FOLDER}/z_symbol.so"
    machine.must("python3", "-c", UNKNOWN_SYMBOL, SECOND, symbol)
    machine.must("sh", "-c", f'echo text >{FOLDER}/readme.txt; echo text >{FOLDER}/.hidden.so')
    log = Log(machine)
    # The reasons are more lines than the system keeps for a logger that is late.
    with held(lambda: loggers(machine)) as late:
        assert len(late) == 1
        awake = threading.Timer(0.5, lambda: [process.signal(signal.SIGCONT) for process in late.values()])
        awake.start()
        machine.start()
        awake.join()
    try:
        expected = {f"z_{name}.so": text for name, (_, text) in NO_MODULES.items()}
        expected["z_symbol.so"] = "the platform lacks the symbol VLIBCFileRemoveKex"
        for name, text in expected.items():
            machine.wait_until(lambda: log.says("vornd", f"{name} refused: ", text), 5, f"{name}: {log.lines}")
        assert sum("refused: " in line for line in log.lines) == len(expected), log.lines
        assert not log.says("readme") and not log.says("hidden")
        assert machine.client.get() == {"enable_domain": False}
        assert machine.client.call(DIRECTORY, 1, "domains").ok
        assert machine.client.call(EVENTS, 1, "list").ok
        machine.stop()
    finally:
        machine.must("sh", "-c", f"rm -rf {FOLDER}/z_* {FOLDER}/readme.txt {FOLDER}/.hidden.so /tmp/open")
    machine.start()


def test_a_link_to_a_proper_module_is_one(machine):
    machine.stop()
    with away(machine, SECOND):
        machine.must("ln", "-s", SECOND + ".away", SECOND)
        try:
            machine.start()
            assert machine.client.call(DIRECTORY, 1, "domains").ok
            machine.stop()
        finally:
            machine.must("rm", SECOND)
    machine.start()


def test_one_module_does_without_the_other(machine):
    machine.stop()
    with away(machine, FIRST):
        machine.start()
        assert machine.client.call(DIRECTORY, 1, "domains").ok
        answer = machine.client.call(DOMAIN, 1, "get")
        assert (answer.status, answer.code) == (404, 210)
        assert machine.ctl("status").code == 1
        machine.stop()
    machine.start()
    assert machine.client.get() == {"enable_domain": False}


def test_no_start_without_any_module(machine):
    machine.stop()
    for hide, text in [((FIRST, SECOND), f"no module in {FOLDER}"),
                       ((FOLDER,), f"the folder of modules {FOLDER} is missing"),
                       (("/usr/vorn/lib/libvorn-platform.so.1",), "libvorn-platform.so.1")]:
        with away(machine, *hide):
            result = machine.exec(VORND, deadline=10)
            assert result.code != 0 and text in result.err and result.err.count("\n") == 1, result
            assert not machine.exists("/run/vorn/vornd.sock")
    with away(machine, FIRST, SECOND):
        machine.must("sh", "-c", f"seq 1000 >{FIRST}")
        try:
            result = machine.exec(VORND, deadline=10)
            assert result.code == 1, result
            assert result.err == f"vornd: module {FIRST} refused: invalid ELF header\n", result
        finally:
            machine.must("rm", FIRST)
    machine.start()
    assert machine.client.get() == {"enable_domain": False}
