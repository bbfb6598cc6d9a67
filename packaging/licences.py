#!/usr/bin/python3
"""The licences of the libraries that are part of the page: licences.py CONSOLE"""

import json
import pathlib
import sys


def texts(folder):
    """The files with the licence and its notices; a library that has none says its licence in a word."""
    names = sorted(path for path in folder.iterdir() if path.name.upper().startswith(("LICENSE", "LICENCE", "NOTICE")))
    return [path.read_text(encoding="utf-8").strip() for path in names if path.is_file()]


def main():
    console = pathlib.Path(sys.argv[1])
    lock = json.loads((console / "package-lock.json").read_text(encoding="utf-8"))
    print("The administrator's page is built from these libraries besides its own sources.")
    for place, entry in sorted(lock["packages"].items()):
        if not place or entry.get("dev"):
            continue
        name = place.rpartition("node_modules/")[2]
        print(f"\n{'-' * 78}\n{name} {entry['version']}, licence {entry['license']}\n")
        print("\n\n".join(texts(console / place)) or "The library comes with no other text of its licence.")


if __name__ == "__main__":
    main()
