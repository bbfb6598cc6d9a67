#!/usr/bin/python3
"""How the built module is linked: what it needs, and what keeps its memory from being misused."""

import sys
import unittest

import elf

REQUIRED = {"libjsoncpp.so", "libstdc++.so", "libgcc_s.so", "libc.so"}
ALLOWED = REQUIRED | {"libm.so"}


class LinkingCheck(unittest.TestCase):
    library = ""

    @classmethod
    def setUpClass(cls):
        cls.entries = elf.dynamic_entries(cls.library)
        cls.tags = {tag for tag, _ in cls.entries}
        cls.segments = elf.segments(cls.library)

    def values(self, tag):
        return " ".join(value for entry, value in self.entries if entry == tag)

    def test_needs_the_c_cpp_and_json_libraries_only(self):
        names = {name[: name.index(".so") + 3] for name in elf.needed(self.library)}
        self.assertEqual(set(), REQUIRED - names, "needed libraries that are missing")
        self.assertEqual(set(), names - ALLOWED, "libraries that the module must not need")

    def test_every_needed_library_is_found(self):
        self.assertEqual(set(), set(elf.needed(self.library)) - set(elf.library_paths(self.library)))

    def test_symbols_are_bound_at_load_time(self):
        self.assertIn("BIND_NOW", self.values("FLAGS"))
        self.assertIn("NOW", self.values("FLAGS_1"))

    def test_relocated_data_becomes_read_only(self):
        self.assertIn("GNU_RELRO", dict(self.segments))

    def test_stack_is_not_executable(self):
        self.assertEqual("RW", dict(self.segments).get("GNU_STACK"))

    def test_no_segment_is_both_writable_and_executable(self):
        self.assertGreater(len([kind for kind, _ in self.segments if kind == "LOAD"]), 1)
        self.assertEqual([], [segment for segment in self.segments if "W" in segment[1] and "E" in segment[1]])

    def test_code_is_not_relocated(self):
        self.assertNotIn("TEXTREL", self.tags)
        self.assertNotIn("TEXTREL", self.values("FLAGS"))

    def test_libraries_are_looked_for_in_the_usual_places_only(self):
        self.assertEqual(set(), {"RPATH", "RUNPATH"} & self.tags)

    def test_can_be_unloaded(self):
        self.assertNotIn("NODELETE", self.values("FLAGS_1"))
        unique = [symbol.name for symbol in elf.dynamic_symbols(self.library) if symbol.binding == "UNIQUE"]
        self.assertEqual([], unique, "a unique symbol would keep the module loaded")


if __name__ == "__main__":
    LinkingCheck.library = sys.argv[1]
    unittest.main(argv=sys.argv[:1] + sys.argv[2:])
