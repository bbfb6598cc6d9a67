"""A name server that passes questions on to a domain's controller, and answers some of them in its own way.

usage: odd_dns.py ADDRESS CONTROLLER add|only|none|NAME

"add" adds names with control bytes to the answers, "only" leaves out what the controller says besides. With "none"
there is no service record at all; else each of them names the host NAME.
"""

import socket
import struct
import sys

SRV, PTR, TXT, CNAME = 33, 12, 16, 5
ODD = [b"dc1\nworkgroup = EVIL", b"dc1\r\n", b"dc1\x00x", b"\x1b[31mdc1", b"dc1\x7f", b"\xff\xfe", b"-dc1", b"a b;id"]


def name(*labels):
    return b"".join(bytes([len(label)]) + label for label in labels) + b"\0"


def record(kind, data):
    """Of the name that was asked for."""
    return b"\xc0\x0c" + struct.pack(">HHIH", kind, 1, 0, len(data)) + data


def odd_records(kind):
    names = [name(label, b"lab", b"test") for label in ODD]
    if kind == SRV:
        return [record(SRV, struct.pack(">HHH", 0, 200, 389) + each) for each in names]
    if kind in (PTR, CNAME):
        return [record(kind, each) for each in names]
    if kind == TXT:
        return [record(TXT, bytes([len(label)]) + label) for label in ODD]
    return []


def end_of_question(packet):
    at = 12
    while packet[at]:
        at += 1 + packet[at]
    return at + 5


def own_records(kind, mode):
    """What is said to this kind of question; None leaves it to the controller alone."""
    if mode in ("add", "only"):
        return odd_records(kind) or None
    if kind == SRV:
        target = name(*mode.encode().split(b"."))
        return [] if mode == "none" else [record(SRV, struct.pack(">HHH", 0, 100, 389) + target)]
    return None


def answer_to(packet, controller, mode):
    end = end_of_question(packet)
    kind = struct.unpack(">H", packet[end - 4:end - 2])[0]
    odd = own_records(kind, mode)
    if odd is not None and mode != "add":
        return packet[:2] + struct.pack(">HHHHH", 0x8580, 1, len(odd), 0, 0) + packet[12:end] + b"".join(odd)
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as back:
        back.settimeout(5)
        back.sendto(packet, (controller, 53))
        answer = back.recv(65536)
    count, authorities, more = struct.unpack(">HHH", answer[6:12])
    if odd is None or authorities or more or answer[3] & 0x0F:
        return answer
    return answer[:6] + struct.pack(">HHH", count + len(odd), 0, 0) + answer[12:] + b"".join(odd)


def main():
    address, controller, mode = sys.argv[1:]
    front = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
    front.bind((address, 53))
    print("ready", flush=True)
    while True:
        packet, client = front.recvfrom(65536)
        try:
            front.sendto(answer_to(packet, controller, mode), client)
        except (OSError, IndexError, struct.error) as error:
            print(error, flush=True)


if __name__ == "__main__":
    main()
