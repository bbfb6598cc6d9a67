"""Adds many users and groups to the controller's database while the controller is not running.

usage: bulk.py USERS GROUPS

Users are bulk00001 and so on, without a password, so that nobody logs in as one of them; groups are bulkgroup0001 and
so on, with twenty members each.

Each object that is added in the usual way takes longer than the one before it, because the lists of the index get
longer. So one user is added in the usual way, its copies go beneath the directory's own layers without an index, and
the index is made anew in the end.
"""

import os
import struct
import sys
import time
import uuid

import ldb
from samba.auth import system_session
from samba.dbchecker import dbcheck
from samba.dsdb import GTYPE_SECURITY_GLOBAL_GROUP, UF_NORMAL_ACCOUNT, UF_PASSWD_NOTREQD
from samba.param import LoadParm
from samba.samdb import SamDB

FIRST = ["Anna", "Björn", "Chloé", "David", "Elif", "François", "Greta", "Håkon", "Inés", "Jürgen"]
LAST = ["Müller", "Øvrebø", "Şahin", "García", "Smith", "Kowalska", "Nováková", "Larsen", "Weiß", "Dupont", "Rossi"]
FIRST_RID = 100_000  # far above those that the controller will give out itself
MEMBERS = 20
BEGIN = time.monotonic()


def report(text):
    print(f"{time.monotonic() - BEGIN:6.1f} s  {text}", flush=True)


def open_directory():
    config = LoadParm()
    config.load_default()
    return SamDB(url=config.samdb_url(), session_info=system_session(), lp=config), config


def user_name(number):
    return f"bulk{number:05}"


def user_values(number):
    first, last = FIRST[number % len(FIRST)], LAST[number % len(LAST)]
    return {
        "sAMAccountName": user_name(number),
        "givenName": first,
        "sn": last,
        "displayName": f"{first} {last} {number}",
    }


def add_first_user(sam, unit):
    sam.add({"dn": unit, "objectClass": "organizationalUnit"})
    sam.add({
        "dn": f"CN={user_name(1)},{unit}",
        "objectClass": "user",
        "userAccountControl": str(UF_NORMAL_ACCOUNT | UF_PASSWD_NOTREQD),
        **user_values(1),
    })


def replace(message, name, values):
    message[name] = ldb.MessageElement(values, ldb.FLAG_MOD_ADD, name)


def add_copies(path, unit, users):
    """Writes the users after the first one into the file of the domain's objects."""
    raw = ldb.Ldb(f"tdb://{path}")
    template = raw.search(f"CN={user_name(1)},{unit}", ldb.SCOPE_BASE)[0]
    sid = template["objectSid"][0]
    raw.transaction_start()
    # Only the key by which an object is found is kept up to date now.
    index = raw.search("@INDEXLIST", ldb.SCOPE_BASE)[0]
    bare = ldb.Message(index.dn)
    for name in ("@IDXATTR", "@IDXONE"):
        if name in index:
            bare[name] = ldb.MessageElement([], ldb.FLAG_MOD_DELETE, name)
    raw.modify(bare)
    report("index taken away")
    for number in range(2, users + 1):
        copy = ldb.Message()
        for name in template.keys():
            if name not in ("dn", "distinguishedName"):
                replace(copy, name, list(template[name]))
        copy.dn = ldb.Dn(raw, f"CN={user_name(number)},{unit}")
        for name, value in {"cn": user_name(number), "name": user_name(number), **user_values(number)}.items():
            replace(copy, name, [value])
        replace(copy, "objectGUID", [uuid.uuid4().bytes_le])
        replace(copy, "objectSid", [sid[:-4] + struct.pack("<I", FIRST_RID + number)])
        raw.add(copy)
    report(f"{users} users written")
    back = ldb.Message(index.dn)
    for name in bare.keys():
        if name != "dn":
            replace(back, name, list(index[name]))
    raw.modify(back)
    raw.transaction_commit()
    report("index put back")


def add_groups(sam, unit, groups, users):
    size = min(MEMBERS, users)
    sam.transaction_start()
    for number in range(1, groups + 1):
        sam.add({
            "dn": f"CN=bulkgroup{number:04},{unit}",
            "objectClass": "group",
            "sAMAccountName": f"bulkgroup{number:04}",
            "groupType": str(GTYPE_SECURITY_GLOBAL_GROUP),
            "description": f"Group {number} of {groups}",
            "member": [f"CN={user_name((number * MEMBERS + k) % users + 1)},{unit}" for k in range(size)],
        })
    sam.transaction_commit()
    report(f"{groups} groups added")


def main():
    users, groups = int(sys.argv[1]), int(sys.argv[2])
    sam, config = open_directory()
    unit = f"OU=Bulk,{sam.domain_dn()}"
    add_first_user(sam, unit)
    path = os.path.join(config.private_path("sam.ldb.d"), f"{sam.domain_dn().upper()}.ldb")
    del sam
    add_copies(path, unit, users)
    sam, _ = open_directory()
    # The directory's own rules of comparison make the index that it will use.
    dbcheck(sam).reindex_database()
    report("index made anew")
    add_groups(sam, unit, groups, users)
    found = len(sam.search(unit, expression="(&(objectCategory=person)(sAMAccountName=bulk*))", attrs=["cn"]))
    if found != users:
        sys.exit(f"{found} users are found instead of {users}")
    report(f"{found} users found again")


main()
