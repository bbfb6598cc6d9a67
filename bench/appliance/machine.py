"""The appliance that is measured, in a lab of its own."""

import contextlib
import json
import pathlib
import shutil
import tempfile

from appliance import Appliance
from lab import Failed, Lab, password

HOST = "nas1"
DOMAIN = "lab.test"
NETBIOS = "LAB"
USER = "Administrator"
PASSWORD = password(NETBIOS, USER)
VORND = "/usr/vorn/sbin/vornd"
SOCKET = "/run/vorn/vornd.sock"
CONFIGURATION = "/usr/vorn/etc/smb.conf"
INSIDE = pathlib.Path(__file__).with_name("inside.py").read_text(encoding="utf-8")
PYTHON = "/usr/bin/python3"


class Wrong(Exception):
    """Something did not do what is to be measured."""


@contextlib.contextmanager
def lab_with(stage, *options, deadline=900):
    """A lab with one appliance, gone at the end."""
    folder = pathlib.Path(tempfile.mkdtemp(prefix="vorn-bench-"))
    lab = Lab(folder / "lab")
    try:
        lab.up("--appliances", HOST, "--stage", stage, *options, deadline=deadline)
        yield Machine(lab)
    finally:
        lab.down()
        shutil.rmtree(folder, ignore_errors=True)


class Machine(Appliance):
    def __init__(self, lab):
        super().__init__(lab, HOST)

    def inside(self, limit, **job):
        """Does a job of inside.py, within LIMIT seconds."""
        result = self.exec(PYTHON, "-c", INSIDE, input=json.dumps(job), deadline=limit)
        if result.code != 0:
            raise Wrong(f"in {self.host}: {result.text.strip()}")
        return json.loads(result.out)

    def time(self, commands, rounds, deadline=60):
        return self.inside(rounds * len(commands) * deadline + 30, do="time", commands=commands, rounds=rounds,
                           deadline=deadline)

    def join(self):
        answer = self.client.join(DOMAIN, USER, PASSWORD)
        if not answer.ok:
            raise Wrong(f"the join failed: {answer.body}\n{self.ctl('steps').text}")
        return answer

    def leave(self, deadline=60):
        answer = self.client.call("VORN.Core.Directory.Domain", 1, "set", {"enable_domain": False}, deadline=deadline)
        if not answer.ok:
            raise Wrong(f"the leave failed: {answer.body}")
        return answer

    def fresh(self):
        """The host as it is before its first start, vornd running, and a directory that does not know it."""
        self.renew()
        base = ",".join(f"DC={label}" for label in DOMAIN.split("."))
        record = f"DC={self.host},DC={DOMAIN},CN=MicrosoftDNS,DC=DomainDnsZones,{base}"
        for name in (f"CN={self.host.upper()},CN=Computers,{base}", record):
            result = self.lab.exec("dc1", "ldbdel", "-H", "/var/lib/samba/private/sam.ldb", name, deadline=30)
            if result.code != 0 and "No such" not in result.text:
                raise Failed(repr(result))

    def vornd(self):
        """The server's process, as the host counts."""
        return int((self.lab.folder / "hosts" / self.host / "vornd").read_text())
