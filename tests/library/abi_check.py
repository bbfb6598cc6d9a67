#!/usr/bin/python3
"""Holds the binary interface of the built module against the committed description of it for this architecture: what it
exports, and the types that are handed over, with their layouts.

`abi_check.py --describe LIBRARY FILE` writes a description; "cmake --build BUILD --target describe_abi" renews
the committed one, after a change that is meant.
"""

import re
import subprocess
import sys
import unittest

from symbols_check import read_list

# No place of a build gets into a description. What the library needs has a check of its own.
OPTIONS = ["--no-show-locs", "--exported-interfaces-only"]
DESCRIBE = ["--short-locs", "--no-corpus-path", "--no-comp-dir-path", "--no-elf-needed"]


def describe(library):
    command = ["/usr/bin/abidw", *OPTIONS, *DESCRIBE, library]
    return subprocess.run(command, check=True, capture_output=True, text=True, timeout=120).stdout


class AbiCheck(unittest.TestCase):
    library = description = exports_list = ""

    def test_is_as_described(self):
        command = ["/usr/bin/abidiff", *OPTIONS, self.description, self.library]
        result = subprocess.run(command, capture_output=True, text=True, timeout=120, check=False)
        self.assertEqual(0, result.returncode, result.stdout + result.stderr)

    def test_description_is_of_this_architecture(self):
        with open(self.description, encoding="utf-8") as lines:
            described = re.search(r"architecture='([^']*)'", lines.readline())[1]
        self.assertIn(f"architecture='{described}'", describe(self.library).splitlines()[0])

    def test_description_has_every_export(self):
        with open(self.description, encoding="utf-8") as text:
            described = re.findall(r"<elf-symbol name='([^']*)'", text.read())
        self.assertEqual(sorted(read_list(self.exports_list)), sorted(described))

    def test_description_knows_the_types_that_are_handed_over(self):
        with open(self.description, encoding="utf-8") as text:
            content = text.read()
        for name in ("APIRequest", "APIResponse", "APIEntry"):
            self.assertRegex(content, rf"<class-decl name='{name}' size-in-bits='[1-9]")


if __name__ == "__main__":
    if sys.argv[1:2] == ["--describe"]:
        text = describe(sys.argv[2])
        with open(sys.argv[3], "w", encoding="utf-8") as file:
            file.write(text)
    else:
        AbiCheck.library, AbiCheck.description, AbiCheck.exports_list = sys.argv[1:4]
        unittest.main(argv=sys.argv[:1] + sys.argv[4:])
