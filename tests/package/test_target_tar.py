"""The tar for the target: what is in it, and that it is of use to whoever has nothing else."""

import pathlib
import re
import struct
import subprocess
import sys
import tarfile
import zlib

import pytest

from conftest import PROJECT

sys.path.insert(0, str(PROJECT / "tests" / "library"))
import elf  # noqa: E402, the reader of the library's own tests

HEADERS = ["conventions.h", "core.h", "domain.h", "eventlog.h", "network.h", "scheduler.h", "settings.h", "webapi.h",
           "webutils.h"]
TRIPLET = "powerpc-linux-gnu"


@pytest.fixture(scope="module")
def archive(options):
    (path,) = options.packages.glob("*.tar.xz")
    return path


@pytest.fixture(scope="module")
def top(version):
    return f"vorn-directory-domain-{version}-{TRIPLET}"


@pytest.fixture(scope="module")
def folder(archive, top, tmp_path_factory):
    place = tmp_path_factory.mktemp("tar")
    with tarfile.open(archive) as tar:
        tar.extractall(place)
    return place / top


def section(path, name):
    """The bytes of a section; nothing when there is none."""
    process = subprocess.run([f"/usr/bin/{TRIPLET}-objcopy", "-O", "binary", f"--only-section={name}",
                              "--set-section-flags", f"{name}=alloc", path, "/dev/stdout"], check=False, capture_output=True)
    return process.stdout


def sections(path):
    return re.findall(r"^\s*\[\s*\d+\]\s+(\.\S+)", elf.readelf("--sections", path), re.MULTILINE)


def build_id(path):
    return re.search(r"Build ID: ([0-9a-f]{40})\b", elf.readelf("--notes", path))[1]


def test_it_is_named_after_version_and_target(archive, top):
    assert archive.name == f"{top}.tar.xz"


def test_it_holds_these_files_and_no_others(archive, top):
    expected = {"": "d", "debug": "d", "include": "d", "include/platform": "d", "lib": "d"}
    expected.update({name: "f" for name in ("LICENSE", "README.md", "SHA256SUMS", "exports.txt", "symbols.txt",
                                            "debug/vorn_directory_domain.so.debug", "lib/vorn_directory_domain.so")})
    expected.update({f"include/platform/{name}": "f" for name in HEADERS})
    with tarfile.open(archive) as tar:
        members = tar.getmembers()
    assert {member.name: "d" if member.isdir() else "f" for member in members} == \
        {f"{top}/{name}".rstrip("/"): kind for name, kind in expected.items()}
    assert [member.name for member in members] == sorted((member.name for member in members))
    assert {(member.uid, member.gid, member.uname, member.gname) for member in members} == {(0, 0, "", "")}
    assert {oct(member.mode) for member in members if member.isdir()} == {"0o755"}
    assert {oct(member.mode) for member in members if member.isfile()} == {"0o644"}
    assert len({member.mtime for member in members}) == 1


def test_its_own_checksums_are_of_all_files_and_right(folder):
    names = [line.split()[1] for line in (folder / "SHA256SUMS").read_text(encoding="ascii").splitlines()]
    there = (str(path.relative_to(folder)) for path in folder.rglob("*") if path.is_file())
    assert names == sorted(set(there) - {"SHA256SUMS"})
    subprocess.run(["/usr/bin/sha256sum", "--quiet", "--strict", "--check", "SHA256SUMS"], cwd=folder, check=True)


def test_the_library_is_one_of_the_target(folder):
    header = (folder / "lib/vorn_directory_domain.so").read_bytes()[:20]
    assert header[:6] == b"\x7fELF\x01\x02"  # 32 bits, big-endian
    assert struct.unpack(">HH", header[16:20]) == (3, 20)  # a shared object for PowerPC


def test_the_library_is_stripped_and_small(folder):
    library = folder / "lib/vorn_directory_domain.so"
    assert not [name for name in sections(library) if name.startswith(".debug") or name in (".symtab", ".strtab")]
    assert library.stat().st_size < 100_000


def test_a_debugger_finds_the_symbols_that_lie_apart(folder):
    library, symbols = folder / "lib/vorn_directory_domain.so", folder / "debug/vorn_directory_domain.so.debug"
    link = section(library, ".gnu_debuglink")
    name = link[:link.index(b"\0")]
    assert name.decode() == symbols.name
    (checksum,) = struct.unpack(">I", link[-4:])
    assert checksum == zlib.crc32(symbols.read_bytes())
    assert build_id(library) == build_id(symbols)
    assert {".debug_info", ".debug_line", ".symtab"} <= set(sections(symbols))


def test_the_symbols_tell_names_and_lines_of_sources(folder):
    symbols = folder / "debug/vorn_directory_domain.so.debug"
    table = subprocess.run([f"/usr/bin/{TRIPLET}-nm", symbols], check=True, capture_output=True, text=True).stdout
    address = re.search(r"^([0-9a-f]+) T _Z11GetAPITablev$", table, re.MULTILINE)[1]
    found = subprocess.run([f"/usr/bin/{TRIPLET}-addr2line", "--functions", "--demangle", "--exe", symbols, address],
                           check=True, capture_output=True, text=True).stdout.splitlines()
    assert found[0] == "GetAPITable()"
    assert re.fullmatch(r"/usr/src/vorn-directory-domain/src/api_table\.cpp:\d+", found[1])


@pytest.mark.parametrize("name", ["lib/vorn_directory_domain.so", "debug/vorn_directory_domain.so.debug"])
def test_no_path_of_the_machine_that_built_it_is_left(folder, options, name):
    data = (folder / name).read_bytes()
    for path in (PROJECT, options.target_prefix.resolve()):
        assert str(path).encode() not in data


@pytest.mark.parametrize("compiler", [f"{TRIPLET}-g++", "g++"])
@pytest.mark.parametrize("name", HEADERS)
def test_each_header_compiles_alone(folder, options, compiler, name):
    json = options.target_prefix / "include/jsoncpp" if compiler.startswith(TRIPLET) else "/usr/include/jsoncpp"
    subprocess.run([f"/usr/bin/{compiler}", "-std=c++17", "-fsyntax-only", "-Wall", "-Wextra", "-Werror", "-x", "c++",
                    "-I", folder / "include", "-isystem", json, folder / "include/platform" / name], check=True, cwd="/")


def test_the_headers_include_nothing_that_is_not_there(folder):
    for header in (folder / "include/platform").iterdir():
        for name in re.findall(r'^#include "(.*)"$', header.read_text(encoding="utf-8"), re.MULTILINE):
            assert (folder / "include" / name).is_file(), f"{header.name} includes {name}"


def names_of(path):
    lines = (line.strip() for line in path.read_text(encoding="ascii").splitlines())
    return {line for line in lines if line and not line.startswith("#")}


def test_the_list_of_what_the_appliance_supplies_is_what_the_library_asks_for(folder, options):
    library = folder / "lib/vorn_directory_domain.so"
    supplied = set()
    for name in elf.needed(library):
        places = (options.target_prefix / "lib" / name, pathlib.Path("/usr") / TRIPLET / "lib" / name)
        supplied |= {symbol.name for symbol in elf.dynamic_symbols(next(filter(pathlib.Path.exists, places)))
                     if symbol.defined}
    weak = {symbol.name for symbol in elf.dynamic_symbols(library) if symbol.binding == "WEAK"}
    undefined = {symbol.name for symbol in elf.dynamic_symbols(library) if not symbol.defined}
    assert undefined - supplied - weak == names_of(folder / "symbols.txt")


def test_the_list_of_exports_is_what_the_library_exports(folder):
    exported = {symbol.name for symbol in elf.dynamic_symbols(folder / "lib/vorn_directory_domain.so") if symbol.defined}
    assert exported == names_of(folder / "exports.txt")


def test_the_readme_names_every_file_and_the_json_library(folder, version):
    text = (folder / "README.md").read_text(encoding="utf-8")
    assert version in text.splitlines()[0] and "@" not in text
    for name in ("lib/vorn_directory_domain.so", "debug/vorn_directory_domain.so.debug", "include/platform/*.h",
                 "symbols.txt", "exports.txt", "SHA256SUMS", "LICENSE"):
        assert f"`{name}`" in text, name
    (json,) = (name for name in elf.needed(folder / "lib/vorn_directory_domain.so") if name.startswith("libjsoncpp"))
    assert f"`{json}`" in text
