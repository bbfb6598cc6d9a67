#!/usr/bin/python3
"""Holds what the contract's tests call, and what docs/porting.md names, against the list of the platform's operations.

    operations_check.py PROJECT OBJECT_FILE... [TEST...]"""

import os
import re
import subprocess
import sys
import unittest

NM = os.environ.get("NM", "/usr/bin/nm")


def undefined_symbols(path):
    done = subprocess.run([NM, "--undefined-only", path], check=True, capture_output=True, text=True)
    return {line.split()[-1] for line in done.stdout.splitlines()}


def plain_names(symbols):
    """ "VORN::APIPolling::Start" for the linker's spelling of it, with the arguments only where two would be the same."""
    done = subprocess.run(["/usr/bin/c++filt"], input="\n".join(symbols), check=True, capture_output=True, text=True)
    whole = done.stdout.split("\n")
    short = [name.partition("(")[0] for name in whole]
    return [name if short.count(plain) > 1 else plain for name, plain in zip(whole, short)]


class Operations(unittest.TestCase):
    project = ""
    objects = []

    @classmethod
    def setUpClass(cls):
        with open(os.path.join(cls.project, "platform", "symbols.txt"), encoding="ascii") as lines:
            cls.operations = {line.strip() for line in lines if line.strip() and not line.startswith("#")}
        with open(os.path.join(cls.project, "docs", "porting.md"), encoding="utf-8") as document:
            cls.document = document.read()
        cls.called = set().union(*(undefined_symbols(path) for path in cls.objects))

    def test_each_is_called_by_a_test(self):
        self.assertEqual([], sorted(self.operations - self.called), "nothing tries these")

    def test_tests_call_nothing_that_the_module_does_not(self):
        own = re.compile(r"^(VLIB|VORN|WINI|ErrWINI|Bl|_ZNK?4VORN|_ZN8VornConf|_ZN8WebUtils)")
        foreign = sorted(name for name in self.called - self.operations if own.match(name))
        self.assertEqual([], foreign, "a platform need not have these")

    def test_tests_include_nothing_but_the_contract(self):
        folder = os.path.join(self.project, "tests", "contract")
        wrong = []
        for parent, _, names in os.walk(folder):
            for name in names:
                if name.endswith((".cpp", ".h")):
                    with open(os.path.join(parent, name), encoding="utf-8") as source:
                        for included in re.findall(r'#include "([^"]+)"', source.read()):
                            if not included.startswith("platform/") and not os.path.exists(os.path.join(parent, included)):
                                wrong.append(f"{name}: {included}")
        self.assertEqual([], wrong)

    def test_the_document_names_each_in_a_row_of_its_table(self):
        section = self.document.partition("\n## What the appliance supplies\n")[2].partition("\n## ")[0]
        rows = re.findall(r"^\| `([^`]+)` \|", section, re.MULTILINE)
        self.assertEqual(sorted(plain_names(self.operations)), sorted(rows))

    def test_the_document_counts_them(self):
        self.assertEqual([str(len(self.operations))], re.findall(r"(\d+) symbols", self.document))


if __name__ == "__main__":
    arguments = sys.argv[1:]
    Operations.project = arguments.pop(0)
    while arguments and not arguments[0].startswith(("Operations", "-")):
        Operations.objects.append(arguments.pop(0))
    unittest.main(argv=[sys.argv[0], *arguments])
