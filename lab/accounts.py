"""Makes the accounts of one domain in the controller's database, while the controller is not running.

usage: accounts.py DOMAIN <accounts.conf
"""

import sys

import ldb
from samba.auth import system_session
from samba.param import LoadParm
from samba.samdb import SamDB

MINUTE = 60 * 10_000_000  # directory times count in units of 100 ns
FOREVER = -9223372036854775808


def records(lines, domain):
    for line in lines:
        fields = [field.strip() for field in line.split("|")]
        if len(fields) > 2 and fields[1] == domain:
            yield fields[0], fields[2:]


class Directory:
    def __init__(self):
        config = LoadParm()
        config.load_default()
        self.sam = SamDB(url=config.samdb_url(), session_info=system_session(), lp=config)
        self.base = self.sam.domain_dn()
        self.groups = set()

    def set(self, dn, **values):
        message = ldb.Message(ldb.Dn(self.sam, dn))
        for name, value in values.items():
            name = name.replace("_", "-")
            message[name] = ldb.MessageElement([str(value)], ldb.FLAG_MOD_REPLACE, name)
        self.sam.modify(message)

    def set_policy(self):
        # Kept data gets old, so passwords must not expire; who is to fail for want of rights must have none.
        self.set(self.base, maxPwdAge=FOREVER, minPwdAge=0, pwdHistoryLength=0, ms_DS_MachineAccountQuota=0)

    def add_unit(self, path):
        dn = ldb.Dn(self.sam, self.base)
        for level in path.split("/"):
            child = ldb.Dn(self.sam, "OU=x")
            child.set_component(0, "OU", level)
            child.add_base(dn)
            dn = child
        self.sam.add({"dn": str(dn), "objectClass": "organizationalUnit"})

    def add_group(self, name, description):
        self.sam.newgroup(name, description=description)
        self.groups.add(name)

    def add_user(self, name, password, state, display, groups):
        if state == "administrator":
            self.sam.setpassword(f"(sAMAccountName={name})", password, False, name)
            return
        first, _, last = display.partition(" ")
        self.sam.newuser(name, password, givenname=first, surname=last or None)
        for group in filter(None, groups.split(";")):
            self.sam.add_remove_group_members(group, [name])
        who = f"(sAMAccountName={ldb.binary_encode(name)})"
        if state == "disabled":
            self.sam.disable_account(who)
        elif state == "expired":
            self.sam.setexpiry(who, 0, False)
        elif state == "must-change":
            self.sam.force_password_change_at_next_login(who)
        elif state == "locked":
            self.make_lockable(self.sam.search(self.base, expression=who, attrs=[])[0].dn)
        elif state != "plain":
            raise ValueError(f"{name}: there is no state {state!r}")

    def make_lockable(self, user):
        """Two wrong passwords lock this user, and nobody else, for weeks."""
        self.sam.add({
            "dn": f"CN=lock,CN=Password Settings Container,CN=System,{self.base}",
            "objectClass": "msDS-PasswordSettings",
            "msDS-PasswordSettingsPrecedence": "10",
            "msDS-PasswordReversibleEncryptionEnabled": "FALSE",
            "msDS-PasswordHistoryLength": "0",
            "msDS-PasswordComplexityEnabled": "FALSE",
            "msDS-MinimumPasswordLength": "1",
            "msDS-MinimumPasswordAge": "0",
            "msDS-MaximumPasswordAge": str(FOREVER),
            "msDS-LockoutThreshold": "2",
            "msDS-LockoutObservationWindow": str(-50_000 * MINUTE),
            "msDS-LockoutDuration": str(-50_000 * MINUTE),
            "msDS-PSOAppliesTo": str(user),
        })


def main():
    directory = Directory()
    directory.sam.transaction_start()
    try:
        directory.set_policy()
        for kind, fields in records(sys.stdin, sys.argv[1]):
            if kind == "unit":
                directory.add_unit(fields[0])
            elif kind == "group":
                directory.add_group(*fields[:2])
            elif kind == "user":
                directory.add_user(*fields[:5])
    except BaseException:
        directory.sam.transaction_cancel()
        raise
    directory.sam.transaction_commit()


main()
