"""What readelf tells of a shared object."""

import os
import re
import subprocess
from collections import namedtuple

Symbol = namedtuple("Symbol", "name version kind binding defined")


def readelf(option, path):
    command = ["/usr/bin/readelf", "--wide", option, path]
    return subprocess.run(command, check=True, capture_output=True, text=True).stdout


def dynamic_symbols(path):
    """The entries of the dynamic symbol table; version markers are not symbols and are left out."""
    symbols = []
    for line in readelf("--dyn-syms", path).splitlines():
        fields = line.split()
        if len(fields) < 8 or not fields[0].rstrip(":").isdigit():
            continue
        kind, binding, section, text = fields[3], fields[4], fields[6], fields[7]
        name, _, version = text.partition("@")
        if section != "ABS" and kind != "SECTION":
            symbols.append(Symbol(name, version.lstrip("@"), kind, binding, section != "UND"))
    return symbols


def dynamic_entries(path):
    """The dynamic section as pairs of tag and value."""
    found = re.findall(r"^\s*0x[0-9a-f]+\s+\((\w+)\)\s+(.*)$", readelf("--dynamic", path), re.MULTILINE)
    return [(tag, value.strip()) for tag, value in found]


def needed(path):
    return [re.search(r"\[(.*)\]", value).group(1) for tag, value in dynamic_entries(path) if tag == "NEEDED"]


def segments(path):
    """The program headers as pairs of type and flags, e.g. ("GNU_STACK", "RW")."""
    pattern = r"^\s+([A-Z_]+)\s+(?:0x[0-9a-f]+\s+){5}([RWE ]{3})\s"
    return [(kind, flags.replace(" ", "")) for kind, flags in re.findall(pattern, readelf("--segments", path), re.MULTILINE)]


def library_paths(path):
    """Where each library that the object needs lies: for a module of another machine in the named folders, else where
    the loader of this one finds it."""
    folders = [folder for folder in os.environ.get("VORN_LIBRARY_FOLDERS", "").split(":") if folder]
    if folders:
        found = ((name, os.path.join(folder, name)) for name in needed(path) for folder in folders)
        return {name: place for name, place in found if os.path.exists(place)}
    output = subprocess.run(["/usr/bin/ldd", path], check=True, capture_output=True, text=True).stdout
    return dict(re.findall(r"^\s+(\S+) => (/\S+) ", output, re.MULTILINE))
