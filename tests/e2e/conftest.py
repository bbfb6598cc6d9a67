"""What the end-to-end tests share. See CAUTION: they need root, and bring up domain controllers on this machine."""

import os
import signal
import threading

import pytest

from appliance import Appliance, Directory
from door import Door
from lab import Lab, password


def pytest_addoption(parser):
    parser.addoption("--stage", metavar="FOLDER", help="the staged tree of the project, put into the appliances")


def pytest_sessionstart(session):
    # A shell that runs this in the background ignores Ctrl-C, and all that is started here would inherit that. A worker
    # may be in another thread, and has inherited what the first process has done.
    if threading.current_thread() is threading.main_thread():
        signal.signal(signal.SIGINT, signal.default_int_handler)
    if os.geteuid() != 0:
        pytest.exit("only root can bring up a lab; run the end-to-end tests as root", returncode=4)


@pytest.fixture(scope="session")
def lab_folder(tmp_path_factory):
    return tmp_path_factory.mktemp("lab")


@pytest.fixture(scope="session")
def lab(lab_folder, pytestconfig):
    """All controllers, and the appliances nas1 and nas2. Tests leave it as they found it."""
    lab = Lab(lab_folder / "state")
    stage = pytestconfig.getoption("--stage")
    try:
        lab.up("--trust", "--nt4", "--appliances", "nas1,nas2", *(["--stage", stage] if stage else []))
        yield lab
    finally:
        lab.down()


@pytest.fixture
def appliance(lab):
    """nas1 as it is before its first start, vornd running; what it may have left in the directory is gone."""
    machine = Appliance(lab, "nas1")
    machine.renew()
    remove_computer(lab, "nas1")
    yield machine
    lab.must("fault", "none", "dc1")


@pytest.fixture
def member(appliance):
    """An appliance that has joined LAB.TEST."""
    answer = appliance.client.join("lab.test", "Administrator", password("LAB", "Administrator"))
    assert answer.ok, appliance.ctl("steps").text + appliance.syslog()
    return appliance


@pytest.fixture(scope="module")
def joined(lab):
    """One member of LAB.TEST for all tests of a file; each leaves it as it found it."""
    machine = Appliance(lab, "nas1")
    machine.renew()
    remove_computer(lab, "nas1")
    answer = machine.client.join("lab.test", "Administrator", password("LAB", "Administrator"))
    assert answer.ok, machine.ctl("steps").text + machine.syslog()
    return machine


@pytest.fixture
def door(appliance):
    """vorn-httpd of nas1, running; nobody is logged in. The appliance is as before its first start."""
    entrance = Door(appliance)
    entrance.start()
    yield entrance
    entrance.end()


@pytest.fixture(scope="module")
def shared_door(lab):
    """One door for all tests of a file, on an appliance that is no member; each leaves it running."""
    machine = Appliance(lab, "nas1")
    machine.renew()
    entrance = Door(machine)
    entrance.start()
    yield entrance
    entrance.end()


@pytest.fixture
def directory(lab):
    return Directory(lab, "dc1")


def remove_computer(lab, name):
    """The account, and its record in DNS: what another account made there, a new one may not remove."""
    nodes = "DC=DomainDnsZones,DC=lab,DC=test"
    found = Directory(lab, "dc1").search(f"(sAMAccountName={name.upper()}$)", "dn")
    found += Directory(lab, "dc1").search(f"(&(objectClass=dnsNode)(name={name}))", "dn", base=nodes)
    for line in found.splitlines():
        if line.startswith("dn: "):
            # Not samba-tool, which takes seconds to start.
            result = lab.exec("dc1", "ldbdel", "-r", "-H", "/var/lib/samba/private/sam.ldb", line[4:], deadline=30)
            assert result.code == 0, result
