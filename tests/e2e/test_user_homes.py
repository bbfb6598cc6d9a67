"""The home folders of domain users, as a client of the network sees them."""

import stat

from lab import password

ADMINISTRATOR = ("Administrator", password("LAB", "Administrator"))
SETTINGS = "/etc/vorninfo.conf"
HOME = "/home/LAB/alice"


def client(machine, *commands, share="alice", user="alice"):
    """smbclient on the other appliance, with the commands."""
    words = ["smbclient", f"//{machine.lab.address(machine.host)}/{share}", "-U", f"LAB\\{user}", "-c",
             "; ".join(commands)]
    return machine.lab.exec("nas2", *words, env={"PASSWD": password("LAB", user)}, deadline=60)


def switch(machine, value):
    lines = machine.read(SETTINGS).decode().splitlines()
    kept = [line for line in lines if not line.startswith("enableduserhome=")]
    machine.write(SETTINGS, "\n".join([*kept, f"enableduserhome={value}", ""]))
    answer = machine.client.join("lab.test", *ADMINISTRATOR)
    assert answer.ok, machine.ctl("steps").text


def test_a_user_has_a_home_folder_while_the_setting_is_on(appliance, lab):
    switch(appliance, "yes")
    assert not appliance.exists(HOME)
    lab.must("exec", "nas2", "sh", "-c", "echo kept by alice >/tmp/letter; rm -f /tmp/letter.back")
    result = client(appliance, "put /tmp/letter letter", "get letter /tmp/letter.back")
    assert result.code == 0, result
    assert lab.exec("nas2", "cat", "/tmp/letter.back").out == "kept by alice\n"
    assert appliance.read(f"{HOME}/letter") == b"kept by alice\n"
    owner = int(appliance.must("id", "-u", "LAB\\alice").out)
    for path, mode in [(HOME, 0o700), (f"{HOME}/letter", 0o600)]:
        info = appliance.path(path).stat()
        assert (stat.S_IMODE(info.st_mode), info.st_uid) == (mode, owner) and owner >= 1000000, path
    # Nobody else comes in, and nobody gets a folder without coming.
    result = client(appliance, "ls", user="norights")
    assert result.code != 0 and "tree connect failed" in result.text, result
    assert not appliance.exists("/home/LAB/norights")

    switch(appliance, "no")
    result = client(appliance, "ls")
    assert result.code != 0 and "NT_STATUS_BAD_NETWORK_NAME" in result.text, result
    assert appliance.read(f"{HOME}/letter") == b"kept by alice\n"
