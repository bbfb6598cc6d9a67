#!/usr/bin/python3
"""Holds the symbols of the built module against the lists of what it exports and of what the appliance supplies."""

import sys
import unittest

import elf

# The start files of the compiler refer to these, and the loader leaves them alone when nobody has them.
OPTIONAL = {"_ITM_deregisterTMCloneTable", "_ITM_registerTMCloneTable", "__gmon_start__", "__cxa_finalize"}


def read_list(path):
    with open(path, encoding="ascii") as lines:
        names = [line.strip() for line in lines]
    return [name for name in names if name and not name.startswith("#")]


class SymbolsCheck(unittest.TestCase):
    library = exports_list = platform_list = ""

    @classmethod
    def setUpClass(cls):
        symbols = elf.dynamic_symbols(cls.library)
        cls.exports = [symbol for symbol in symbols if symbol.defined]
        cls.undefined = [symbol for symbol in symbols if not symbol.defined]
        cls.listed = read_list(cls.exports_list)
        cls.platform = read_list(cls.platform_list)
        cls.supplied = {}
        for path in elf.library_paths(cls.library).values():
            for symbol in elf.dynamic_symbols(path):
                if symbol.defined:
                    cls.supplied.setdefault(symbol.name, set()).add(symbol.version)

    def test_every_listed_symbol_is_exported(self):
        self.assertEqual([], sorted(set(self.listed) - {symbol.name for symbol in self.exports}))

    def test_every_exported_symbol_is_listed(self):
        self.assertEqual([], sorted({symbol.name for symbol in self.exports} - set(self.listed)))

    def test_the_list_of_exports_names_each_once(self):
        self.assertEqual(sorted(set(self.listed)), sorted(self.listed))
        self.assertEqual(16, len(self.listed))

    def test_exports_are_strong_functions_and_one_table(self):
        for symbol in self.exports:
            self.assertEqual("OBJECT" if symbol.name == "gTable" else "FUNC", symbol.kind, symbol.name)
            self.assertEqual("GLOBAL", symbol.binding, symbol.name)

    def test_every_undefined_symbol_has_a_supplier(self):
        missing = []
        for symbol in self.undefined:
            versions = self.supplied.get(symbol.name, set())
            found = symbol.version in versions if symbol.version else bool(versions)
            if not found and symbol.name not in self.platform and symbol.name not in OPTIONAL:
                missing.append(symbol.name)
        self.assertEqual([], missing, "neither in symbols.txt nor in a library that the module is linked with")

    def test_every_platform_symbol_is_used(self):
        self.assertEqual([], sorted(set(self.platform) - {symbol.name for symbol in self.undefined}))

    def test_no_platform_symbol_comes_from_a_library(self):
        self.assertEqual([], sorted(set(self.platform) & set(self.supplied)))

    def test_platform_symbols_are_required_by_the_loader(self):
        weak = [symbol.name for symbol in self.undefined if symbol.name in self.platform and symbol.binding != "GLOBAL"]
        self.assertEqual([], weak)


if __name__ == "__main__":
    SymbolsCheck.library, SymbolsCheck.exports_list, SymbolsCheck.platform_list = sys.argv[1:4]
    unittest.main(argv=sys.argv[:1] + sys.argv[4:])
