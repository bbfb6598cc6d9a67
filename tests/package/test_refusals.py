"""What ./dev package refuses to pack, each time in one line."""

import shutil
import subprocess
import tarfile

import pytest

from conftest import PROJECT
from machine import run

TRIPLET = "powerpc-linux-gnu"


@pytest.fixture
def tree(tmp_path):
    """What the commands read of the project, to be changed."""
    top = tmp_path / "project"
    for name in ("dev.d", "tests/library", "platform"):
        shutil.copytree(PROJECT / name, top / name)
    shutil.copy(PROJECT / "CMakeLists.txt", top)
    return top


@pytest.fixture
def library(options, tmp_path):
    (path,) = options.packages.glob("*.tar.xz")
    with tarfile.open(path) as tar:
        (member,) = (entry for entry in tar.getmembers() if entry.name.endswith("lib/vorn_directory_domain.so"))
        (tmp_path / "library.so").write_bytes(tar.extractfile(member).read())
    return tmp_path / "library.so"


def call(tree, options, *words):
    """A function of the commands."""
    script = ('cd "$1" && ROOT=$1 COMMAND=package && . dev.d/common.sh && . dev.d/package.sh && start_log && '
              'TARGET_PREFIX=$2 && shift 2 && "$@"')
    return run(["/bin/bash", "-euo", "pipefail", "-c", script, "call", tree, options.target_prefix, *words])


def failure(result):
    lines = [line for line in result.text.splitlines() if line.startswith("FAILED: ")]
    assert result.code == 1 and len(lines) == 1, result
    return lines[0]


def test_the_library_as_it_is_passes(tree, options, library):
    result = call(tree, options, "check_symbols", library)
    assert result.code == 0, result


@pytest.mark.parametrize("change", [lambda text: text + "VORNNobodyCallsThis\n",
                                    lambda text: text.replace("VORNWinJoin1\n", "")], ids=["one too many", "one too few"])
def test_a_list_of_symbols_that_is_not_the_librarys(tree, options, library, change):
    path = tree / "platform" / "symbols.txt"
    before = path.read_text(encoding="ascii")
    path.write_text(change(before), encoding="ascii")
    assert path.read_text(encoding="ascii") != before
    assert "symbols are not those of platform/symbols.txt" in failure(call(tree, options, "check_symbols", library))


def test_a_library_that_a_debugger_could_not_tell_from_others(tree, options, library, tmp_path):
    subprocess.run([f"/usr/bin/{TRIPLET}-objcopy", "--remove-section", ".note.gnu.build-id", library], check=True)
    assert "no build id" in failure(call(tree, options, "split_library", library, tmp_path))


def test_a_project_without_a_version(tree, options):
    path = tree / "CMakeLists.txt"
    path.write_text(path.read_text(encoding="utf-8").replace(" VERSION ", " "), encoding="utf-8")
    assert "does not tell the version" in failure(call(tree, options, "project_version"))


def test_a_folder_that_can_not_be_written(tmp_path):
    place = tmp_path / "file"
    place.write_text("kept", encoding="ascii")
    result = run([PROJECT / "dev", "package", "--output", place / "below"])
    assert "can't be written" in failure(result) and len(result.text.strip().splitlines()) == 1
    assert place.read_text(encoding="ascii") == "kept"


@pytest.mark.parametrize("words", [["--output"], ["--part"], ["--part", "other"], ["--other"], ["other"]])
def test_a_wrong_command_line(words):
    result = run([PROJECT / "dev", "package", *words])
    assert result.code == 2 and "--help" in result.text, result
