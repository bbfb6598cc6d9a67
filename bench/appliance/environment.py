"""The machine and the programs that were measured."""

import os
import pathlib
import platform
import subprocess
import time

ROOT = pathlib.Path(__file__).resolve().parents[2]
PACKAGES = {"Samba": "samba", "MIT Kerberos": "libkrb5-3", "OpenLDAP's library": "libldap-2.5-0",
            "SQLite": "libsqlite3-0", "realmd": "realmd", "adcli": "adcli"}


def line_of(path, name):
    for line in pathlib.Path(path).read_text(encoding="utf-8").splitlines():
        key, _, value = line.partition(":" if ":" in line else "=")
        if key.strip() == name:
            return value.strip().strip('"')
    return "unknown"


def version_of(package):
    result = subprocess.run(["dpkg-query", "-W", "-f", "${Version}", package], capture_output=True, text=True,
                            check=False, timeout=30)
    return result.stdout if result.returncode == 0 else "not installed"


def load():
    return f"{os.getloadavg()[0]:.2f}"


def before(stage):
    # The server's run path leads to its libraries in the staged tree.
    vornd = subprocess.run([str(stage / "usr/vorn/sbin/vornd"), "--version"], capture_output=True, text=True,
                           check=False, timeout=30)
    revision = subprocess.run(["git", "-C", str(ROOT), "describe", "--always", "--dirty"], capture_output=True,
                              text=True, check=False, timeout=30)
    memory = int(line_of("/proc/meminfo", "MemTotal").split()[0]) / 1024 ** 2
    return {
        "processor": f"{os.cpu_count()} cores, \"{line_of('/proc/cpuinfo', 'model name')}\"",
        "memory": f"{memory:.1f} GiB",
        "system": f"{line_of('/etc/os-release', 'PRETTY_NAME')}, Linux {platform.release()}",
        "appliance": f"{vornd.stdout.strip() or 'unknown'}, revision {revision.stdout.strip() or 'unknown'}",
        "measured": time.strftime("%Y-%m-%d"),
        "programs": ", ".join(f"{name} {version_of(package)}" for name, package in PACKAGES.items()),
        "load before": load(),
    }


def after():
    return {"load after": load()}


def table_of(record):
    load_line = f"load average {record['load before']} before the run and {record['load after']} after it"
    rows = [[name, value] for name, value in record.items() if not name.startswith("load ")]
    return "\n".join(["| | |", "|---|---|", *(f"| {name} | {value} |" for name, value in [*rows, ["load", load_line]])])
