#!/usr/bin/python3
"""Puts a list of users in place of a domain's own, in the format that the appliance keeps: make_list.py DOMAIN COUNT."""

import os
import sqlite3
import sys
import time

FOLDER = "/usr/vorn/etc/private/directory"
LINKS = "/usr/vorn/etc/private"


def main():
    domain, count = sys.argv[1], int(sys.argv[2])
    final = f"{FOLDER}/user_{domain}.db"
    new = f"{FOLDER}/new_list"
    database = sqlite3.connect(new)
    database.executescript("""
        CREATE TABLE entries(name TEXT NOT NULL COLLATE NOCASE, id INTEGER, display TEXT NOT NULL,
                             folded TEXT NOT NULL, PRIMARY KEY(name)) WITHOUT ROWID;
        CREATE TABLE meta(key TEXT PRIMARY KEY, value TEXT NOT NULL) WITHOUT ROWID;""")
    rows = ((f"user{number:06}", 1100000 + number, f"Person {number:06}") for number in range(count))
    database.executemany("INSERT INTO entries VALUES(?, ?, ?, ?)",
                         ((name, number, display, f"{name}\n{display.lower()}") for name, number, display in rows))
    facts = {"domain": domain, "kind": "user", "count": count, "fetched": int(time.time()), "source": "ldap",
             "controller": "made for a test"}
    database.executemany("INSERT INTO meta VALUES(?, ?)", ((key, str(value)) for key, value in facts.items()))
    database.commit()
    database.close()
    os.chmod(new, 0o600)
    os.rename(new, final)
    link = f"{LINKS}/domain_user_{domain}.db"
    if os.path.lexists(link):
        os.unlink(link)
    os.link(final, link)


main()
