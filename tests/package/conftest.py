"""What the tests of the packages share. They need root: each machine is a set of namespaces."""

import os
import pathlib
import re
import shutil

import pytest

from machine import Machine, must

PROJECT = pathlib.Path(__file__).resolve().parents[2]
NAMES = ["vorn-directory-domain", "vorn-appliance", "vorn-console"]
# Services that come with a dependency are not to start while a root is filled: they would be this machine's.
POLICY = "#!/bin/sh\nexit 101\n"


def pytest_addoption(parser):
    for name, text in (("packages", "what ./dev package has made"), ("again", "the Debian packages, made a second time"),
                       ("elsewhere", "the tar, made in another folder"), ("bare-root", "a bare Debian root"),
                       ("archives", "packages of Debian that are there already; new ones are put there"),
                       ("target-prefix", "the target's JSON library")):
        parser.addoption(f"--{name}", metavar="FOLDER", help=text, type=pathlib.Path, required=True)


def pytest_sessionstart(session):
    if os.geteuid() != 0:
        pytest.exit("only root can make machines; run the tests of the packages as root", returncode=4)


@pytest.fixture(scope="session")
def options(pytestconfig):
    return pytestconfig.option


@pytest.fixture(scope="session")
def packages(options):
    """The three Debian packages by name."""
    found = {path.name.partition("_")[0]: path for path in options.packages.glob("*.deb")}
    assert sorted(found) == sorted(NAMES)
    return found


@pytest.fixture(scope="session")
def version():
    text = (PROJECT / "CMakeLists.txt").read_text(encoding="utf-8")
    return re.search(r"^project\(\w+ VERSION ([0-9.]+) ", text, re.MULTILINE)[1]


@pytest.fixture(scope="session")
def space(tmp_path_factory):
    """A folder that others may pass through: services of machines run as users of their own."""
    folder = tmp_path_factory.mktemp("machines")
    for path in (folder, *folder.parents[:2]):
        path.chmod(0o755)
    return folder


def inside(options, root, *words):
    """A command in a root, with this machine's network."""
    commands = PROJECT / "dev.d"
    return must(["/usr/bin/unshare", "--mount", "--pid", "--fork", "--kill-child", "--propagation", "unchanged",
                 "/bin/bash", commands / "own_mounts.sh", "/bin/bash", commands / "fresh_inside.sh", root, "/",
                 options.archives, "env", "DEBIAN_FRONTEND=noninteractive", *words], deadline=600)


@pytest.fixture(scope="session")
def ready_root(options, packages, space):
    """The bare root with all that the packages depend on, as apt finds out, and nothing of the packages themselves."""
    root = space / "ready"
    must(["/bin/cp", "-a", options.bare_root, root], deadline=120)
    folder = root / "opt" / "packages"
    folder.mkdir()
    for path in packages.values():
        shutil.copy(path, folder)
    policy = root / "usr" / "sbin" / "policy-rc.d"
    policy.write_text(POLICY, encoding="ascii")
    policy.chmod(0o755)
    inside(options, root, "apt-get", "-q", "update")
    plan = inside(options, root, "sh", "-c", "apt-get -qq --simulate --no-install-recommends install /opt/packages/*.deb")
    needed = [name for name in re.findall(r"^Inst (\S+)", plan, re.MULTILINE) if name not in NAMES]
    assert "samba" in needed and "systemd" in needed, plan
    inside(options, root, "apt-get", "-q", "install", "-y", "--no-install-recommends", *needed)
    policy.unlink()
    shutil.rmtree(folder)
    folder.mkdir()
    return root


@pytest.fixture(scope="module")
def machine(ready_root, space, request):
    """A machine for a file of tests, with all that the packages need. Its own kind, "systemd" or "plain", is MACHINE."""
    name = request.module.__name__
    with Machine(ready_root, space / name, request.module.MACHINE) as made:
        yield made
