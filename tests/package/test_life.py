"""A machine that systemd runs, from the installation to the purge: an upgrade keeps what was changed, a removal gives
Samba back, a purge leaves nothing. The tests of this file go on where the one before has stopped."""

import pathlib
import re
import shutil

import pytest

from machine import must, processes_of, until
from snapshot import differences, named, snapshot

MACHINE = "systemd"
NAMES = ["vorn-console", "vorn-appliance", "vorn-directory-domain"]
CONFIGURATION = "--configfile=/usr/vorn/etc/smb.conf"
SERVICES = ["vornd.service", "vorn-httpd.service"]


def newer(version):
    first, _, last = version.rpartition(".")
    return f"{first}.{int(last) + 1}"


@pytest.fixture(scope="module")
def next_packages(packages, version, tmp_path_factory):
    """The same packages as the next version: another number, another default, another log-in by PAM."""
    folder = tmp_path_factory.mktemp("next")
    made = []
    for name, path in packages.items():
        tree = folder / name
        must(["/usr/bin/dpkg-deb", "--raw-extract", path, tree])
        control = tree / "DEBIAN" / "control"
        text = control.read_text(encoding="utf-8")
        text = text.replace(f"Version: {version}\n", f"Version: {newer(version)}\n")
        control.write_text(text.replace(f"(= {version})", f"(= {newer(version)})"), encoding="utf-8")
        for changed in ("usr/vorn/share/defaults/smb.conf", "etc/pam.d/vorn"):
            if (tree / changed).exists():
                with (tree / changed).open("a", encoding="utf-8") as file:
                    file.write("# the next version\n")
        made.append(folder / path.name.replace(version, newer(version)))
        must(["/usr/bin/dpkg-deb", "--root-owner-group", "--build", tree, made[-1]], 120)
        shutil.rmtree(tree)
    return made


@pytest.fixture(scope="module")
def story(machine):
    """What the tests hand on to those that follow."""
    machine.put()
    return {"before": snapshot(machine)}


def state_of(machine, unit):
    return machine.run("systemctl", "is-active", unit).text.strip()


def test_it_is_installed_and_used(machine, story, packages):
    machine.install(*packages.values())
    for unit in SERVICES:
        assert state_of(machine, unit) == "active", machine.journal()
    machine.must("vornctl", "options", "--sync-time", "on", "--nested-groups", "7")
    conf = machine.path("/usr/vorn/etc/smb.conf")
    with conf.open("a", encoding="utf-8") as file:
        file.write("\n[work]\n    path = /srv\n")
    with machine.path("/etc/vorninfo.conf").open("a", encoding="utf-8") as file:
        file.write("kept=yes\n")
    with machine.path("/etc/pam.d/vorn").open("a", encoding="utf-8") as file:
        file.write("# of the administrator\n")
    machine.must("useradd", "--no-create-home", "--groups", "administrators", "carol")
    story["changed"] = {path: machine.path(path).read_text(encoding="utf-8") for path in (
        "/usr/vorn/etc/smb.conf", "/usr/vorn/etc/smbinfo.conf", "/etc/vorninfo.conf", "/etc/pam.d/vorn", "/etc/cron.d/vorn",
        "/etc/group")}
    assert "vornwin" in story["changed"]["/etc/cron.d/vorn"]
    story["certificate"] = sorted(path.name for path in machine.path("/var/lib/vorn-httpd").iterdir())
    assert story["certificate"]


def kept(machine, story):
    return {path: machine.path(path).read_text(encoding="utf-8") for path in story["changed"]} == story["changed"]


def test_an_upgrade_keeps_what_was_changed_and_starts_the_new_programs(machine, story, next_packages, version):
    before = {unit: machine.unit(unit, "MainPID")["MainPID"] for unit in SERVICES}
    smbd = machine.unit("smbd.service", "MainPID")
    machine.install(*next_packages)
    assert machine.must("dpkg-query", "--show", "--showformat", "${Version}", "vorn-appliance") == newer(version)
    assert kept(machine, story)
    for unit in SERVICES:
        assert state_of(machine, unit) == "active"
        assert machine.unit(unit, "MainPID")["MainPID"] not in ("0", before[unit])
    # Whoever reads or writes a file just now notices nothing.
    assert machine.unit("smbd.service", "MainPID") == smbd
    assert machine.path("/etc/pam.d/vorn.dpkg-dist").exists()
    machine.must("rm", "/etc/pam.d/vorn.dpkg-dist")
    assert "7" in machine.must("vornctl", "options")


def test_a_service_that_was_disabled_stays_so_over_an_upgrade(machine, packages, next_packages):
    machine.must("systemctl", "disable", "--now", "vorn-httpd.service")
    for files in (packages.values(), next_packages):
        machine.must("dpkg", "--force-confdef", "--install", *machine.put(*files), deadline=120)
    assert machine.run("systemctl", "is-enabled", "vorn-httpd.service").text.strip() == "disabled"
    machine.must("systemctl", "enable", "--now", "vorn-httpd.service")


def test_a_removal_gives_samba_its_own_configuration_again(machine, story):
    machine.apt("remove", *NAMES)
    assert processes_of(machine, "/usr/vorn/") == []
    for unit in SERVICES:
        assert machine.unit(unit, "LoadState")["LoadState"] in ("not-found", "masked")
    for unit in ("smbd.service", "nmbd.service", "winbind.service"):
        until(lambda name=unit: state_of(machine, name) == "active", 60, f"{unit} runs")
        assert machine.arguments(unit) and CONFIGURATION not in machine.arguments(unit)
        assert "vorn" not in machine.must("systemctl", "cat", unit)
    assert not machine.path("/etc/cron.d/vorn").exists()
    left = {path: text for path, text in story["changed"].items() if path != "/etc/cron.d/vorn"}
    assert {path: machine.path(path).read_text(encoding="utf-8") for path in left} == left


def test_a_second_installation_finds_what_was_left(machine, story, next_packages):
    machine.install(*next_packages)
    for unit in SERVICES:
        until(lambda name=unit: state_of(machine, name) == "active", 30, f"{unit} runs")
    assert kept(machine, story)
    assert CONFIGURATION in machine.arguments("smbd.service")
    assert story["certificate"] == sorted(path.name for path in machine.path("/var/lib/vorn-httpd").iterdir())


def test_a_package_that_was_only_unpacked_is_removed_with_its_services(machine, packages):
    machine.must("dpkg", "--unpack", *machine.put(*packages.values()), deadline=120)
    assert state_of(machine, "vornd.service") == "active"
    machine.apt("remove", *NAMES)
    assert processes_of(machine, "/usr/vorn/") == []
    machine.install(*packages.values())
    assert state_of(machine, "vornd.service") == "active"


def test_a_purge_leaves_no_trace(machine, story):
    machine.apt("purge", *NAMES)
    machine.must("userdel", "carol")
    machine.must("rm", "-r", "/opt/packages")
    machine.must("mkdir", "/opt/packages")
    after = snapshot(machine)
    assert differences(story["before"], after, systemd=True) == []
    assert named(after, "vorn") == []
    for folder in ("/run", "/tmp", "/run/systemd"):
        names = [pathlib.PurePath(entry).name for entry in machine.path(folder).iterdir()]
        assert [name for name in names if re.search("vorn|^domain_", name)] == []
    assert "vorn" not in machine.must("systemctl", "list-unit-files", "--plain", "--no-legend")
    for unit in ("smbd.service", "nmbd.service", "winbind.service"):
        assert state_of(machine, unit) == "active"
