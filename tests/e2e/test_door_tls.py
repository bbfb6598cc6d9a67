"""How the door speaks TLS: versions, ciphers, its certificate; and where it listens."""

import contextlib
import re
import signal
import socket
import ssl
import struct
import subprocess
import threading
import time
import warnings

import pytest

from door import Door
from processes import programs

STATE = "/var/lib/vorn-httpd"
GOOD = {"ECDHE-ECDSA-AES128-GCM-SHA256", "ECDHE-ECDSA-AES256-GCM-SHA384", "ECDHE-ECDSA-CHACHA20-POLY1305"}
UNPRIVILEGED = ("setpriv", "--reuid=vorn-httpd", "--regid=vorn-httpd", "--clear-groups", "--no-new-privs",
                "--inh-caps=-all", "--bounding-set=-all", "--")
OLD = [ssl.TLSVersion.TLSv1, ssl.TLSVersion.TLSv1_1]
NEW = [ssl.TLSVersion.TLSv1_2, ssl.TLSVersion.TLSv1_3]


def context_of(version, ciphers="ALL:@SECLEVEL=0"):
    """A client that can do this version only, and takes whatever it is given."""
    context = Door.tls_context()
    context.set_ciphers(ciphers)
    with warnings.catch_warnings():
        warnings.simplefilter("ignore", DeprecationWarning)
        context.minimum_version = version
        context.maximum_version = version
    return context


@contextlib.contextmanager
def lenient_server(door, tmp_path):
    """A server that takes any version: whether the clients of these tests can do what the door is to refuse."""
    for name in ("certificate.pem", "key.pem"):
        (tmp_path / name).write_bytes(door.appliance.read(f"{STATE}/{name}"))
    context = ssl.SSLContext(ssl.PROTOCOL_TLS_SERVER)
    context.load_cert_chain(tmp_path / "certificate.pem", tmp_path / "key.pem")
    context.set_ciphers("ALL:@SECLEVEL=0")
    with warnings.catch_warnings():
        warnings.simplefilter("ignore", DeprecationWarning)
        context.minimum_version = ssl.TLSVersion.TLSv1
    with socket.create_server(("127.0.0.1", 0)) as listener:
        def serve():
            with contextlib.suppress(OSError):
                while True:
                    plain = listener.accept()[0]
                    with contextlib.suppress(OSError), context.wrap_socket(plain, server_side=True) as connection:
                        connection.recv(1)

        threading.Thread(target=serve, daemon=True).start()
        yield listener.getsockname()[1]
        listener.shutdown(socket.SHUT_RDWR)


@pytest.mark.parametrize("version", OLD)
def test_old_versions_are_refused(shared_door, tmp_path, version):
    with pytest.raises((ssl.SSLError, ConnectionError)):
        shared_door.connect(context=context_of(version)).close()
    with lenient_server(shared_door, tmp_path) as port, socket.create_connection(("127.0.0.1", port)) as plain, \
            context_of(version).wrap_socket(plain) as connection:
        assert connection.version() == version.name.replace("_", ".")


@pytest.mark.parametrize("version", NEW)
def test_present_versions_work(shared_door, version):
    context = context_of(version, "DEFAULT")
    with shared_door.connect(context=context) as connection:
        assert connection.version() == version.name.replace("_", ".")
        assert connection.compression() is None
        connection.sendall(b"GET /healthz HTTP/1.1\r\nHost: x\r\n\r\n")
        assert connection.recv(4096).startswith(b"HTTP/1.1 200 ")


def test_only_strong_ciphers_are_accepted(shared_door):
    listed = subprocess.run(["openssl", "ciphers", "-s", "-tls1_2", "ALL:COMPLEMENTOFALL:@SECLEVEL=0"],
                            capture_output=True, text=True, check=True, timeout=10).stdout.strip().split(":")
    assert len(listed) > 40 and GOOD < set(listed)
    accepted = set()
    for cipher in listed:
        with contextlib.suppress(ssl.SSLError, ConnectionError):
            with shared_door.connect(context=context_of(NEW[0], f"{cipher}:@SECLEVEL=0")) as connection:
                accepted.add(connection.cipher()[0])
    assert accepted == GOOD


def test_the_protocol_is_told(shared_door):
    for offered, chosen in ((["http/1.1"], "http/1.1"), (["h2", "http/1.1"], "http/1.1"), ([], None)):
        context = Door.tls_context()
        if offered:
            context.set_alpn_protocols(offered)
        with shared_door.connect(context=context) as connection:
            assert connection.selected_alpn_protocol() == chosen
    context = Door.tls_context()
    context.set_alpn_protocols(["h2"])
    with pytest.raises((ssl.SSLError, ConnectionError)):
        shared_door.connect(context=context).close()


def test_nothing_is_compressed(shared_door):
    """A client that offers compression gets none. No library of today offers it: the offer is put in by hand."""
    incoming, outgoing = ssl.MemoryBIO(), ssl.MemoryBIO()
    with contextlib.suppress(ssl.SSLWantReadError):
        context_of(NEW[0], "DEFAULT").wrap_bio(incoming, outgoing).do_handshake()
    record = bytearray(outgoing.read())
    place = 5 + 4 + 2 + 32
    place += 1 + record[place]  # the session
    place += 2 + struct.unpack_from(">H", record, place)[0]  # the ciphers
    assert record[place:place + 2] == b"\x01\x00"
    record[place:place + 2] = b"\x02\x01\x00"
    struct.pack_into(">H", record, 3, len(record) - 5)
    record[6:9] = (len(record) - 9).to_bytes(3, "big")
    with socket.create_connection((shared_door.address, shared_door.port), timeout=10) as plain:
        plain.sendall(record)
        answer = plain.recv(65536)
    assert answer[0] == 22 and answer[5] == 2, answer[:20]
    place = 5 + 4 + 2 + 32
    place += 1 + answer[place] + 2
    assert answer[place] == 0


def test_no_renegotiation(shared_door):
    """In the middle of a connection nothing is agreed anew, which would cost the door far more than the client."""
    client = subprocess.Popen(["openssl", "s_client", "-connect", f"{shared_door.address}:{shared_door.port}",
                               "-tls1_2", "-legacy_renegotiation"],
                              stdin=subprocess.PIPE, stdout=subprocess.PIPE, stderr=subprocess.STDOUT)
    try:
        time.sleep(0.5)
        client.stdin.write(b"R\n")
        client.stdin.flush()
        text = client.communicate(timeout=10)[0].decode(errors="replace")
    finally:
        client.kill()
        client.wait(10)
    assert "RENEGOTIATING" in text and "no renegotiation" in text, text


def test_clear_text_is_told_where_to_go(shared_door):
    begin = time.monotonic()
    with socket.create_connection((shared_door.address, shared_door.port), timeout=10) as plain:
        plain.sendall(b"GET /webapi HTTP/1.1\r\nHost: x\r\n\r\n")
        received = bytearray()
        with contextlib.suppress(ConnectionError):
            while piece := plain.recv(4096):
                received += piece
    assert received.startswith(b"HTTP/1.1 400 ") and b"https://" in received
    assert b"\r\nConnection: close\r\n" in received
    with socket.create_connection((shared_door.address, shared_door.port), timeout=10) as plain:
        plain.sendall(b"SSH-2.0-client\r\n" * 20)
        with contextlib.suppress(ConnectionError):
            while plain.recv(4096):
                pass
    assert time.monotonic() - begin < 5


# The certificate.

def certificate(machine):
    result = machine.must("openssl", "x509", "-in", f"{STATE}/certificate.pem", "-noout", "-text", "-fingerprint")
    return result.out


def test_the_certificate_is_made_once(door):
    machine = door.appliance
    first = certificate(machine)
    names = set(re.findall(r"(?:DNS|IP Address):([^,\s]+)", first))
    assert {"nas1", "localhost", "127.0.0.1"} <= names, names
    assert "NIST CURVE: P-256" in first and "ecdsa-with-SHA256" in first
    assert "CA:FALSE" in first and "TLS Web Server Authentication" in first
    for name, mode in (("key.pem", "600"), ("certificate.pem", "644")):
        found = machine.must("stat", "-c", "%U %a", f"{STATE}/{name}").out
        assert found == f"vorn-httpd {mode}\n", name
    shown = ssl.get_server_certificate((door.address, door.port))
    assert shown.strip() == machine.read(f"{STATE}/certificate.pem").decode().strip()
    door.stop()
    door.start()
    assert certificate(machine) == first
    # A damaged one is replaced.
    door.stop()
    machine.write(f"{STATE}/certificate.pem", "nonsense\n")
    door.start()
    assert certificate(machine) != first


def test_a_certificate_of_ones_own(door):
    machine = door.appliance
    made = certificate(machine)
    machine.must("openssl", "req", "-x509", "-newkey", "rsa:2048", "-nodes", "-subj", "/CN=own.test", "-days", "2",
                 "-keyout", f"{STATE}/own-key.pem", "-out", f"{STATE}/own.pem")
    machine.must("chown", "vorn-httpd", f"{STATE}/own-key.pem", f"{STATE}/own.pem")
    door.stop()
    door.start("--certificate", f"{STATE}/own.pem", "--key", f"{STATE}/own-key.pem")
    shown = ssl.get_server_certificate((door.address, door.port))
    assert shown.strip() == machine.read(f"{STATE}/own.pem").decode().strip()
    # Only who has given one wants browsers to insist on it.
    assert "max-age=" in door.get("/healthz").headers["Strict-Transport-Security"]
    assert certificate(machine) == made
    door.stop()
    door.start()
    assert "Strict-Transport-Security" not in door.get("/healthz").headers
    for options, reason in ((["--certificate", f"{STATE}/own.pem"], "go together"),
                            (["--certificate", f"{STATE}/own.pem", "--key", f"{STATE}/key.pem"], "does not belong"),
                            (["--certificate", "/nowhere", "--key", f"{STATE}/key.pem"], "/nowhere")):
        result = machine.exec(*UNPRIVILEGED, "/usr/vorn/sbin/vorn-httpd", "--listen", "127.0.0.1:9443", *options,
                              deadline=10)
        assert result.code in (1, 2) and reason in result.err and len(result.err.splitlines()) <= 2, result


def test_the_certificate_is_read_anew_when_told(door):
    machine = door.appliance
    before = ssl.get_server_certificate((door.address, door.port))
    door.stop()
    machine.must("openssl", "req", "-x509", "-newkey", "ec", "-pkeyopt", "ec_paramgen_curve:P-256", "-nodes", "-days",
                 "2", "-subj", "/CN=own.test", "-keyout", f"{STATE}/key.pem", "-out", f"{STATE}/certificate.pem")
    machine.must("chown", "vorn-httpd", f"{STATE}/key.pem", f"{STATE}/certificate.pem")
    door.start()
    # One that ends soon is made anew at the start.
    renewed = ssl.get_server_certificate((door.address, door.port))
    assert renewed != before and "nas1" in certificate(machine) and "own.test" not in certificate(machine)
    with door.connect() as kept:
        for damage in ("rm {0}/certificate.pem", "echo x >{0}/key.pem"):
            machine.must("sh", "-c", damage.format(STATE))
            for process in programs(machine, "vorn-httpd"):
                process.signal(signal.SIGHUP)

            def is_new(former=renewed):
                return ssl.get_server_certificate((door.address, door.port)) != former

            machine.wait_until(is_new, 10, damage)
            renewed = ssl.get_server_certificate((door.address, door.port))
        kept.sendall(b"GET /healthz HTTP/1.1\r\nHost: x\r\n\r\n")
        assert kept.recv(4096).startswith(b"HTTP/1.1 200 ")


# Where it listens.

def test_clear_text_is_for_this_machine_alone(appliance):
    own = appliance.lab.address("nas1")
    for address in (f"{own}:8443", "0.0.0.0:8443", "[::]:8443", "[::ffff:10.77.0.101]:8443"):
        result = appliance.exec(*UNPRIVILEGED, "/usr/vorn/sbin/vorn-httpd", "--clear-text",
                                "--listen", "127.0.0.1:8444", "--listen", address, deadline=10)
        assert result.code == 2 and "--clear-text" in result.err and len(result.err.splitlines()) == 1, result


def test_root_is_refused(appliance):
    result = appliance.exec("/usr/vorn/sbin/vorn-httpd", "--listen", "127.0.0.1:8444", deadline=10)
    assert result.code == 1 and "root" in result.err, result


def test_it_listens_on_loopback_unless_told_otherwise(appliance):
    appliance.must("install", "-d", "-m", "700", "-o", "vorn-httpd", "-g", "vorn-httpd", STATE)
    script = 'exec 1>/dev/null 2>&1 </dev/null; setsid "$@" & '
    appliance.must("sh", "-c", script, "start", *UNPRIVILEGED, "/usr/vorn/sbin/vorn-httpd")
    try:
        def listening():
            lines = appliance.must("ss", "-Hltn").out.splitlines()
            return {line.split()[3] for line in lines}

        appliance.wait_until(lambda: any(place.endswith(":8443") for place in listening()), 10, "listening")
        assert listening() <= {"127.0.0.1:8443", "[::1]:8443"} and "127.0.0.1:8443" in listening()
    finally:
        for process in programs(appliance, "vorn-httpd"):
            process.signal(signal.SIGTERM)
    appliance.wait_until(lambda: not programs(appliance, "vorn-httpd"), 10, "the end")
