"""The same sources give the same bytes, wherever, whenever and by whomever they are packed."""

import os
import shutil
import subprocess

import pytest

from conftest import PROJECT
from machine import must, run


def test_the_target_made_in_another_folder_is_the_same(options):
    first, second = sorted(options.packages.glob("*.tar.xz")), sorted(options.elsewhere.glob("*.tar.xz"))
    assert len(first) == 1
    assert [path.name for path in first] == [path.name for path in second]
    assert first[0].read_bytes() == second[0].read_bytes()


def test_the_debian_packages_made_again_are_the_same(options, packages):
    again = {path.name: path for path in options.again.glob("*.deb")}
    assert sorted(again) == sorted(path.name for path in packages.values())
    for path in packages.values():
        assert path.read_bytes() == again[path.name].read_bytes(), path.name


def test_the_checksums_are_of_all_files_and_right(options):
    sums = (options.packages / "SHA256SUMS").read_text(encoding="utf-8")
    names = sorted(line.split()[1] for line in sums.splitlines())
    assert names == sorted(path.name for path in options.packages.iterdir() if path.name != "SHA256SUMS")
    assert len(names) == 4
    subprocess.run(["/usr/bin/sha256sum", "--quiet", "--strict", "--check", "SHA256SUMS"], cwd=options.packages, check=True)


def test_the_checksums_of_the_second_time_are_the_same(options):
    lines = set((options.packages / "SHA256SUMS").read_text(encoding="utf-8").splitlines())
    for folder in (options.again, options.elsewhere):
        assert set((folder / "SHA256SUMS").read_text(encoding="utf-8").splitlines()) < lines


@pytest.fixture
def tree(tmp_path):
    """The project's commands in a folder of their own, last changed in 2020 and 2022 and committed in 2023."""
    shutil.copytree(PROJECT / "dev.d", tmp_path / "dev.d")
    for path in tmp_path.rglob("*"):
        os.utime(path, (1600000000, 1600000000))
    os.utime(tmp_path / "dev.d" / "common.sh", (1650000000, 1650000000))
    git = ["/usr/bin/env", "GIT_COMMITTER_DATE=@1700000000 +0900", "/usr/bin/git", "-C", tmp_path, "-c", "user.name=x",
           "-c", "user.email=x@localhost"]
    for words in (["init", "--quiet"], ["add", "."], ["commit", "--quiet", "--message=x"]):
        must([*git, *words])
    return tmp_path


def version_date(tree, *environment):
    script = 'cd "$1" && ROOT=$1 && . dev.d/common.sh && . dev.d/package.sh && version_date'
    return run(["/usr/bin/env", "--unset=SOURCE_DATE_EPOCH", *environment, "/bin/bash", "-euo", "pipefail", "-c", script,
                "date", tree])


def test_files_are_as_old_as_the_last_commit(tree):
    assert version_date(tree).text.strip() == "1700000000"


def test_without_git_files_are_as_old_as_the_newest(tree):
    shutil.rmtree(tree / ".git")
    assert version_date(tree).text.strip() == "1650000000"


def test_somebody_else_may_say_how_old_files_are(tree):
    assert version_date(tree, "SOURCE_DATE_EPOCH=1234567890").text == "1234567890"
    wrong = version_date(tree, "SOURCE_DATE_EPOCH=yesterday")
    assert wrong.code == 1 and "FAILED: SOURCE_DATE_EPOCH" in wrong.text
