"""docs/appliance.md against the sources that it speaks of: every fixed path, every operation."""

import itertools
import pathlib
import re
import subprocess
import unittest

from vornctl_case import DEADLINE, main

ROOT = pathlib.Path(__file__).resolve().parents[3]
PATH = r"/(?:usr|etc|var|run|tmp|bin|dev|home)(?:/[\w.*+-]+)*"

# What stands in the sources and need not stand in the document.
EXCEPTIONS = {
    "/dev/null": "no file of anyone's",
    "/dev/log": "the system's logger",
    "/dev/tty": "the terminal of who calls vornctl",
    "/run": "the end of a path in a folder of Samba's own",
}


def page():
    return (ROOT / "docs" / "appliance.md").read_text(encoding="utf-8")


def sources():
    """The sources without their comments."""
    for path in sorted([*(ROOT / "appliance").rglob("*"), *(ROOT / "src").rglob("*")]):
        if path.suffix in (".cpp", ".h"):
            yield re.sub(r"^\s*//[^\n]*|(?<=[;{}]) +//[^\n]*", "", path.read_text(encoding="utf-8"), flags=re.MULTILINE)


def constants(text):
    return dict(re.findall(r'\b(k\w+)(?:\[\])? = "([^"\\]*)"', text))


def fixed_paths():
    """Every path in a text of the sources, and what is put behind a path that has a name there."""
    texts = list(sources())
    everywhere = {}
    for text in texts:
        everywhere.update(constants(text))
    found = set()
    for text in texts:
        for literal in re.findall(r'"((?:[^"\\\n]|\\.)*)"', text):
            if ":/" not in literal:  # which is the programs' search path
                found.update(path.rstrip(".") for path in re.findall(rf"(?:(?<=[ =>])|^){PATH}", literal))
        known = {**everywhere, **constants(text)}
        added = r'\b(?:Path|string)\((k\w+)\) \+ (?:std::string\()?(?:"([^"]+)"|(k\w+))'
        for name, literal, other in re.findall(added, text):
            ending = literal or known.get(other, "")
            if known.get(name, "").startswith("/") and re.match(r"[/.][a-z]", ending):
                found.add(known[name] + ending)
    return found


def expanded(word):
    """Each meaning of "a{b,c}d"."""
    parts = re.split(r"\{([^{}]*)\}", word)
    choices = [part.split(",") if place % 2 else [part] for place, part in enumerate(parts)]
    return ["".join(choice) for choice in itertools.product(*choices)]


def named_paths(text):
    words = [path for word in re.findall(r"`([^`\n]+)`", text) for path in re.findall(r"/[\w.*+{},/-]+", word)]
    return {path.rstrip("/") for word in words for path in expanded(word)}


def is_named(path, names):
    """The path itself, or the folder of one that is named; of a path to which something is added, its beginning."""
    path = path.rstrip("/")
    if path[-1] in "*_-":
        return any(name.startswith(path.rstrip("*")) for name in names)
    return any(name == path or name.startswith(path + "/") for name in names)


def operations():
    """The names of the module's undefined symbols, and of the class of each that is a member of one."""
    lines = (ROOT / "platform" / "symbols.txt").read_text(encoding="ascii").splitlines()
    symbols = [line for line in lines if line and not line.startswith("#")]
    done = subprocess.run(["/usr/bin/c++filt"], input="\n".join(symbols), capture_output=True, text=True, check=True,
                          timeout=DEADLINE)
    names = [line.partition("(")[0] for line in done.stdout.split("\n")]
    return [(name, name.rpartition("::")[0]) for name in names]


class ApplianceDocument(unittest.TestCase):
    def test_it_names_every_fixed_path(self):
        names = named_paths(page())
        paths = fixed_paths()
        self.assertGreater(len(paths), 80)
        for path in ("/run/vorn/sessions.json", "/run/vorn/schedule.lock", "/run/vorn/join_probe", "/usr/bin/nslookup",
                     "/usr/vorn/etc/private/domain_user*", "/etc/vorninfo.conf.lock"):
            self.assertIn(path, paths, "no longer found in the sources")
        missing = [path for path in sorted(paths - set(EXCEPTIONS)) if not is_named(path, names)]
        self.assertEqual(missing, [], "docs/appliance.md does not name these")

    def test_a_path_that_is_not_named_shows(self):
        names = named_paths(page())
        for path in ("/run/vorn/nowhere", "/run/vorn/vornd", "/usr/bin/ne", "/run/vorn/services-", "/etc/krb5.conf"):
            self.assertFalse(is_named(path, names), path)
        self.assertEqual(named_paths("`/a/{b,c}.d`, `x` and `/e/*`"), {"/a/b.d", "/a/c.d", "/e/*"})

    def test_no_exception_is_left_over(self):
        self.assertEqual(set(EXCEPTIONS) - fixed_paths(), set())

    def test_it_has_a_row_for_every_operation(self):
        section = page().partition("\n## Operations\n")[2].partition("\n## ")[0]
        cells = re.findall(r"^\| (`[^|]+) \|", section, re.MULTILINE)
        rows = [name for cell in cells for name in re.findall("`([^`]+)`", cell)]
        known = operations()
        self.assertGreater(len(known), 70)
        self.assertEqual([name for name, owner in known if name not in rows and owner not in rows], [])
        self.assertEqual(len(rows), len(set(rows)), "named twice")
        self.assertEqual(set(rows) - {word for pair in known for word in pair}, set(), "no operation of the module's")


if __name__ == "__main__":
    main()
