"""One appliance of the lab: its programs, its files, its web API."""

import contextlib
import hashlib
import re
import socket
import time
import uuid

from client import Client
from processes import programs

# What a failed join must not change, nor anything that is refused.
CONFIGURATION = (
    "/usr/vorn/etc/smb.conf",
    "/etc/resolv.conf",
    "/etc/vorninfo.conf",
    "/etc/krb5.keytab",
    "/etc/krb5.conf",
    "/usr/vorn/etc/schedule.conf",
    "/etc/cron.d/vorn",
)
USER_DEBUG = 8 + 7
MARK = "the tests were here: "
SMBINFO = "/usr/vorn/etc/smbinfo.conf"
JOURNAL_FOLDER = "/usr/vorn/etc/private/join"
# What is written beside a file before it is put in its place, and what is kept aside.
TEMPORARY = r".*\(\.vorn-[A-Za-z0-9]*\|\.tmp\|\.new\|-journal\|\.damaged\)"
TEMPORARY_FOLDERS = ("/usr/vorn/etc", "/etc", "/run/vorn", "/var/lib/vorn", "/var/log", "/var/lib/samba", "/tmp")
WINBIND_CACHES = [f"{folder}/{name}_cache.tdb" for folder in ("/var/cache/samba", "/var/lib/samba")
                  for name in ("winbindd", "netsamlogon")]
NAME_CACHES = ("/var/cache/samba/gencache.tdb", "/run/samba/gencache.tdb")


class Appliance:
    """HOST of the lab, on which vornd runs."""

    def __init__(self, lab, host):
        self.lab = lab
        self.host = host

    @property
    def client(self):
        return Client(str(self.path("/run/vorn/vornd.sock")))

    # Programs.

    def exec(self, *words, deadline=60, input=None, env=None):
        return self.lab.exec(self.host, *words, deadline=deadline, input=input, env=env)

    def must(self, *words, deadline=60, input=None, env=None):
        result = self.exec(*words, deadline=deadline, input=input, env=env)
        assert result.code == 0, result
        return result

    def ctl(self, *words, deadline=120, input=None):
        return self.exec("/usr/vorn/bin/vornctl", *words, deadline=deadline, input=input)

    def start(self):
        self.lab.vornd(self.host, "start")

    def stop(self):
        self.lab.vornd(self.host, "stop")

    def kill(self):
        self.lab.vornd(self.host, "kill")

    def renew(self):
        """The machine as it was before its first start, vornd running."""
        self.lab.must("renew", self.host)
        self.start()

    def net(self, *words, user=None, password=None, deadline=60):
        """Samba's "net" on the appliance's own configuration."""
        login = ["-U", user] if user else []
        return self.exec(
            "net",
            "--configfile=/usr/vorn/etc/smb.conf",
            *words,
            *login,
            deadline=deadline,
            env={"PASSWD": password} if password else None,
        )

    # Files.

    def path(self, path):
        """Where a file of the appliance is to be found on this machine."""
        return self.lab.root(self.host) / path.lstrip("/")

    def read(self, path):
        """The content as bytes; None when there is no such file."""
        try:
            return self.path(path).read_bytes()
        except FileNotFoundError:
            return None

    def write(self, path, content):
        self.path(path).write_bytes(content.encode() if isinstance(content, str) else content)

    def exists(self, path):
        return self.path(path).exists()

    def configuration(self):
        """Content, mode and owner of the files that a failed join leaves alone."""
        state = {}
        for path in CONFIGURATION:
            with contextlib.suppress(FileNotFoundError):
                info = self.path(path).stat()
                state[path] = (self.path(path).read_bytes(), oct(info.st_mode), info.st_uid, info.st_gid)
        state[SMBINFO] = self.smbinfo_but("advanced_domain_option", "register nic")
        return state

    def smbinfo_but(self, *keys):
        """The keys and values of smbinfo.conf, without some."""
        lines = (self.read(SMBINFO) or b"").decode(errors="backslashreplace").splitlines()
        pairs = {}
        for line in lines:
            if "=" in line:
                key, value = (part.strip() for part in line.split("=", 1))
                if key not in keys:
                    pairs[key] = value
        return pairs

    def temporaries(self):
        found = self.exec("find", *TEMPORARY_FOLDERS, "-xdev", "-regex", TEMPORARY).out.split("\n")
        # Samba keeps databases whose names look alike.
        return [path for path in found if path and not path.startswith("/var/lib/samba/")]

    def left_by_joins(self):
        """What no join leaves behind, however it ended."""
        folder = self.path(JOURNAL_FOLDER)
        journal = [str(path) for path in folder.rglob("*")] if folder.exists() else []
        probe = ["/run/vorn/join_probe"] if self.exists("/run/vorn/join_probe") else []
        return self.temporaries() + journal + probe

    def secrets(self):
        """The names of what Samba keeps secret."""
        if not self.exists("/var/lib/samba/private/secrets.tdb"):
            return set()
        dump = self.must("tdbdump", "/var/lib/samba/private/secrets.tdb").out
        return {key.removesuffix("\\00") for key in re.findall(r'^key\(\d+\) = "(.*)"$', dump, re.M)}

    def syslog(self):
        """All that was said to the system log before this call, without the mark that tells when it is all there."""
        mark = f"{MARK}{uuid.uuid4()}"
        with socket.socket(socket.AF_UNIX, socket.SOCK_DGRAM) as log:
            log.sendto(f"<{USER_DEBUG}>{mark}".encode(), str(self.path("/dev/log")))
        end = time.monotonic() + 10
        while True:
            lines = (self.read("/var/log/syslog") or b"").decode(errors="backslashreplace").splitlines(keepends=True)
            if any(line.endswith(f"{mark}\n") for line in lines):
                return "".join(line for line in lines if MARK not in line)
            assert time.monotonic() < end, "the system log does not write what it is told"
            time.sleep(0.02)

    def option_of_samba(self, key):
        """What the file-sharing service takes for the value of a key."""
        result = self.must("testparm", "-s", f"--parameter-name={key}", "/usr/vorn/etc/smb.conf")
        return result.out.strip()

    # The membership, asked of Samba and not of the appliance's own programs.

    def trust_works(self, kind="ads", deadline=30):
        result = self.net(kind, "testjoin", deadline=deadline)
        return result.code == 0 and "OK" in result.text

    def wait_until(self, condition, seconds, what):
        end = time.monotonic() + seconds
        while not condition():
            assert time.monotonic() < end, f"{what}: not within {seconds} s"
            time.sleep(0.05)


def assert_cleared(machine, domain="LAB", realm="LAB.TEST"):
    """Nothing of the membership is left on the appliance; to be asked right after a leave."""
    assert machine.client.get() == {"enable_domain": False}
    conf = machine.read("/usr/vorn/etc/smb.conf")
    assert domain.encode() not in conf.upper(), conf
    secrets = [key for key in machine.secrets() if key.upper().endswith((f"/{domain}", f"/{realm}"))]
    assert secrets == [], secrets
    keys = machine.exec("klist", "-k")
    assert keys.code != 0 or realm not in keys.out, keys
    assert not programs(machine, "winbindd"), "winbindd runs in a workgroup"
    # The file-sharing service may begin the cache of names again.
    left = [path for path in WINBIND_CACHES + ["/usr/vorn/etc/private/former_keys.json"] if machine.exists(path)]
    left += [path for path in NAME_CACHES if domain.encode() in (machine.read(path) or b"").upper()]
    left += machine.left_by_joins()
    assert left == [], left
    assert machine.client.test_dc() is False


class Directory:
    """What an Active Directory holds, seen on its controller."""

    def __init__(self, lab, controller):
        self.lab = lab
        self.controller = controller

    def search(self, expression, *attributes, base=None):
        words = ["ldbsearch", "-H", "/var/lib/samba/private/sam.ldb", *(["-b", base] if base else [])]
        result = self.lab.exec(self.controller, *words, expression, *attributes, deadline=30)
        assert result.code == 0, result
        return result.out

    def objects(self):
        """Every object with its state, but for what a log-in alone changes; as a set of digests with names."""
        records = self.search("(objectClass=*)", "distinguishedName", "userAccountControl", "servicePrincipalName")
        found = set()
        for record in records.split("\n\n"):
            lines = sorted(line for line in record.splitlines() if line and not line.startswith("#"))
            names = [line for line in lines if line.startswith("dn: ")]
            if names:
                found.add((names[0], hashlib.sha256("\n".join(lines).encode()).hexdigest()))
        return found

    def dns_nodes(self):
        """The names in the zone of LAB.TEST; of the appliances' names also what they say."""
        records = self.search("(objectClass=dnsNode)", "dnsRecord", base="DC=DomainDnsZones,DC=lab,DC=test")
        nodes = set()
        for record in records.split("\n\n"):
            lines = [line for line in record.splitlines() if line and not line.startswith("#")]
            # Of its own records the controller may renew the times.
            nodes.update(lines[:1] if lines and not lines[0].startswith("dn: DC=nas") else ["\n".join(lines)])
        return nodes

    def computer(self, name):
        return f"CN={name.upper()}," in self.search(f"(sAMAccountName={name.upper()}$)", "dn")
