"""The Debian packages, looked at without installing them."""

import io
import re
import subprocess
import tarfile

import pytest

from conftest import NAMES, PROJECT
from machine import must

APPLIANCE = {
    "etc/pam.d/vorn", "lib/systemd/system/vornd.service", "lib/systemd/system/vorn-httpd.service",
    "lib/systemd/system/smbd.service.d/vorn.conf", "lib/systemd/system/nmbd.service.d/vorn.conf",
    "lib/systemd/system/winbind.service.d/vorn.conf", "usr/bin/vornctl", "usr/lib/sysusers.d/vorn-appliance.conf",
    "usr/lib/sysusers.d/vorn-httpd.conf", "usr/lib/tmpfiles.d/vorn-appliance.conf",
    "usr/share/bash-completion/completions/vornctl", "usr/share/man/man1/vornctl.1.gz", "usr/vorn/bin/vornctl",
    "usr/vorn/lib/libvorn-platform.so.1", "usr/vorn/lib/modules/appliance_directory.so", "usr/vorn/sbin/vorn-httpd",
    "usr/vorn/sbin/vornauth", "usr/vorn/sbin/vornd", "usr/vorn/sbin/vornjoin", "usr/vorn/sbin/vornwin",
    "usr/vorn/share/capabilities.conf", "usr/vorn/share/defaults/smb.conf", "usr/vorn/share/defaults/vorninfo.conf",
    "usr/vorn/share/error-codes.json", "usr/vorn/share/methods.json"}
DOCUMENTS = {
    "vorn-directory-domain": {"changelog.gz", "copyright"},
    "vorn-appliance": {"changelog.gz", "copyright", "NEWS.md.gz", "README.md.gz", "SECURITY.md.gz", "packages.md.gz"},
    "vorn-console": {"changelog.gz", "copyright", "LICENCES.gz"}}
# What the appliance's programs start, and the package that has it.
STARTED = ["samba", "samba-common-bin", "winbind", "smbclient", "bind9-dnsutils", "cron | cron-daemon", "systemd",
           "libnss-winbind", "libsasl2-modules-gssapi-mit"]


@pytest.fixture(scope="module")
def members(packages):
    """The entries of each package's tar, by their paths without the leading "./"."""
    found = {}
    for name, path in packages.items():
        data = subprocess.run(["/usr/bin/dpkg-deb", "--fsys-tarfile", path], check=True, capture_output=True).stdout
        with tarfile.open(fileobj=io.BytesIO(data)) as tar:
            found[name] = {member.name.removeprefix("./"): member for member in tar.getmembers()}
    return found


def files(members, name):
    return {path for path, member in members[name].items() if not member.isdir()}


def payload(members, name):
    """Without what every package of Debian has."""
    common = (f"usr/share/doc/{name}/", "usr/share/lintian/overrides/")
    return {path for path in files(members, name) if not path.startswith(common)}


def control(packages, name, field):
    return must(["/usr/bin/dpkg-deb", "--field", packages[name], field]).strip()


@pytest.mark.parametrize("name", NAMES)
def test_the_version_is_the_projects(packages, version, name):
    assert control(packages, name, "Version") == version
    architecture = must(["/usr/bin/dpkg", "--print-architecture"]).strip() if name != "vorn-console" else "all"
    assert packages[name].name == f"{name}_{version}_{architecture}.deb"


@pytest.mark.parametrize("name", NAMES)
def test_documents_are_where_debian_looks_for_them(members, name):
    folder = f"usr/share/doc/{name}/"
    assert {path.removeprefix(folder) for path in files(members, name) if path.startswith(folder)} == DOCUMENTS[name]


def test_the_appliance_holds_these_files_and_no_others(members):
    assert payload(members, "vorn-appliance") == APPLIANCE


def test_the_module_is_one_library(members):
    assert payload(members, "vorn-directory-domain") == {"usr/vorn/lib/modules/vorn_directory_domain.so"}


def test_the_console_is_the_page_that_was_built(members):
    page = PROJECT / "console" / "dist"
    built = {f"usr/vorn/share/console/{path.relative_to(page)}" for path in page.rglob("*") if path.is_file()}
    assert payload(members, "vorn-console") == built
    assert "usr/vorn/share/console/index.html" in built


@pytest.mark.parametrize("name", NAMES)
def test_everything_is_roots_and_nobody_elses_to_change(members, name):
    programs = re.compile(r"usr/vorn/s?bin/.*")
    for path, member in members[name].items():
        assert (member.uid, member.gid) == (0, 0), path
        if not member.issym():
            expected = 0o755 if member.isdir() or programs.fullmatch(path) else 0o644
            assert member.mode == expected, (path, oct(member.mode))


def test_no_two_packages_hold_the_same_file(members):
    seen = [path for name in NAMES for path in files(members, name)]
    assert len(seen) == len(set(seen))


def test_every_file_is_as_old_as_the_version(members):
    assert len({member.mtime for name in NAMES for member in members[name].values()}) == 1


def test_only_what_administrators_change_is_a_configuration_file(packages):
    assert must(["/usr/bin/dpkg-deb", "--info", packages["vorn-appliance"], "conffiles"]).split() == ["/etc/pam.d/vorn"]
    for name in ("vorn-directory-domain", "vorn-console"):
        assert "conffiles" not in must(["/usr/bin/dpkg-deb", "--info", packages[name]])


def test_what_the_appliance_starts_is_among_its_dependencies(packages):
    depends = control(packages, "vorn-appliance", "Depends").split(", ")
    assert not set(STARTED) - set(depends), depends


def test_the_packages_belong_together_version_by_version(packages, version):
    assert f"vorn-directory-domain (= {version})" in control(packages, "vorn-appliance", "Depends").split(", ")
    assert control(packages, "vorn-console", "Depends") == f"vorn-appliance (= {version})"
    assert "vorn" not in control(packages, "vorn-directory-domain", "Depends")


def test_libraries_are_dependencies(packages):
    for name in ("vorn-directory-domain", "vorn-appliance"):
        assert "libjsoncpp25 " in control(packages, name, "Depends")


def test_the_licences_of_the_pages_libraries_are_told(packages, tmp_path):
    must(["/usr/bin/dpkg-deb", "--extract", packages["vorn-console"], tmp_path])
    text = must(["/usr/bin/zcat", tmp_path / "usr/share/doc/vorn-console/LICENCES.gz"])
    for library in ("react", "react-dom", "@patternfly/react-core"):
        assert re.search(rf"^{re.escape(library)} [0-9.]+, licence MIT$", text, re.MULTILINE), library
    assert text.count("Permission is hereby granted") >= 10


@pytest.mark.parametrize("name", NAMES)
def test_lintian_finds_no_fault(packages, name):
    must(["/usr/bin/lintian", "--allow-root", "--profile", "debian", "--fail-on", "error,warning", packages[name]], 120)
