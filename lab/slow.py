"""A slow cable: puts a relay between a host's plug and the switch, and holds every frame back for a while.

usage: slow.py HOST MILLISECONDS [ADDRESS]

With an address, only IP packets that the host exchanges with this address are slow. Runs in the switch's namespaces;
the host's plug there is p-HOST. Ends when it is killed.
"""

import collections
import ipaddress
import select
import socket
import subprocess
import sys
import time

ETH_P_ALL = 3
PACKET_OUTGOING = 4
SOL_PACKET = 263
PACKET_VNET_HDR = 15
HEADER = 10  # of virtio: what is known of checksums and segments goes along with the frame
SOL_SOCKET_BUFFER = 8 * 1024 * 1024


def ip(*words):
    subprocess.run(["ip", *words], check=True)


def plug(name):
    port = socket.socket(socket.AF_PACKET, socket.SOCK_RAW, 0)
    port.setsockopt(SOL_PACKET, PACKET_VNET_HDR, 1)
    port.setsockopt(socket.SOL_SOCKET, socket.SO_RCVBUF, SOL_SOCKET_BUFFER)
    port.bind((name, ETH_P_ALL))
    return port


def concerns(frame, address):
    """Whether the frame is of IPv4, from or to the address."""
    packet = frame[HEADER + 14:]
    return frame[HEADER + 12:HEADER + 14] == b"\x08\x00" and address in (packet[12:16], packet[16:20])


def relay(ports, delay, address):
    waiting = collections.deque()  # (when, port, frame); all wait equally long, so the first is always the next
    while True:
        pause = max(0.0, waiting[0][0] - time.monotonic()) if waiting else None
        for port in select.select(ports, [], [], pause)[0]:
            frame, (_, _, kind, *_) = port.recvfrom(HEADER + 65536 + 64)
            if kind == PACKET_OUTGOING:
                continue
            other = ports[1] if port is ports[0] else ports[0]
            if address and not concerns(frame, address):
                other.send(frame)
            else:
                waiting.append((time.monotonic() + delay, other, frame))
        while waiting and waiting[0][0] <= time.monotonic():
            _, port, frame = waiting.popleft()
            try:
                port.send(frame)
            except OSError:
                pass  # a cable loses frames, too


def main():
    host, delay = sys.argv[1], int(sys.argv[2]) / 1000
    address = ipaddress.ip_address(sys.argv[3]).packed if len(sys.argv) > 3 else None
    ip("link", "add", f"s-{host}", "type", "veth", "peer", "name", f"b-{host}")
    ip("link", "set", f"b-{host}", "master", "br0", "up")
    ip("link", "set", f"p-{host}", "nomaster", "promisc", "on", "up")
    ip("link", "set", f"s-{host}", "promisc", "on", "up")
    ports = [plug(f"p-{host}"), plug(f"s-{host}")]
    print("ready", flush=True)
    relay(ports, delay, address)


main()
