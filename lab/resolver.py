"""The name server at the switch's own address: passes questions on to the domains' controllers, and knows nothing else.

usage: resolver.py ADDRESS ZONE=CONTROLLER...

So that a name that does not exist is answered at once, as on a real network, and not when all have given up. UDP only:
what the lab asks fits into a packet.
"""

import selectors
import socket
import sys
import time

PORT = 53
PATIENCE = 10  # seconds for which an answer of a controller is awaited
NAME_ERROR = 3


def question_of(packet):
    """The name that is asked for, in lower case, and where the question ends."""
    labels, at = [], 12
    while packet[at]:
        labels.append(packet[at + 1:at + 1 + packet[at]])
        at += 1 + packet[at]
    return b".".join(labels).lower().decode("latin-1"), at + 5


def does_not_exist(packet):
    _, end = question_of(packet)
    flags = 0x8080 | (packet[2] & 0x79) << 8 | NAME_ERROR
    return packet[:2] + flags.to_bytes(2, "big") + b"\0\1\0\0\0\0\0\0" + packet[12:end]


class Resolver:
    def __init__(self, address, zones):
        self.zones = zones
        self.selector = selectors.DefaultSelector()
        self.front = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
        self.front.bind((address, PORT))
        self.selector.register(self.front, selectors.EVENT_READ)
        self.asked = {}  # socket to a controller: (who asked, until when)

    def controller_of(self, name):
        for zone, controller in self.zones.items():
            if name == zone or name.endswith("." + zone):
                return controller
        return None

    def ask(self, packet, client):
        if len(packet) < 17 or packet[2] & 0x80:
            return
        controller = self.controller_of(question_of(packet)[0])
        if controller is None:
            self.front.sendto(does_not_exist(packet), client)
            return
        back = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
        back.connect((controller, PORT))
        back.send(packet)
        self.asked[back] = (client, time.monotonic() + PATIENCE)
        self.selector.register(back, selectors.EVENT_READ)

    def forget(self, back):
        self.selector.unregister(back)
        back.close()
        return self.asked.pop(back)[0]

    def answer(self, back):
        try:
            packet = back.recv(65535)
        except OSError:  # nobody listens there, or nobody is there; the client's own deadline tells it
            self.forget(back)
            return
        self.front.sendto(packet, self.forget(back))

    def serve(self):
        while True:
            for key, _ in self.selector.select(1):
                if key.fileobj is not self.front:
                    self.answer(key.fileobj)
                    continue
                packet, client = self.front.recvfrom(65535)
                try:
                    self.ask(packet, client)
                except (IndexError, OSError) as error:
                    print(f"{client[0]}: {error!r}", flush=True)
            for back in [back for back, (_, until) in self.asked.items() if until < time.monotonic()]:
                self.forget(back)


def main():
    resolver = Resolver(sys.argv[1], dict(zone.split("=") for zone in sys.argv[2:]))
    print("ready", flush=True)
    resolver.serve()


main()
