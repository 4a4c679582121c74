#!/usr/bin/env python3
"""A tunnel broker for the lab: gives its clients an IPv6 address over UDP and carries their packets (docs/tunnel-broker.md).

usage: tunnel_broker.py SETTINGS

SETTINGS is a JSON file, read anew for each datagram:

    listen     address and UDP port
    prefix     what addresses are made of: the broker has PREFIX::1, its clients PREFIX::2 and so on, all in PREFIX::/64
    accounts   passwords by user name
    anonymous  whether those without an account are taken
    mode       "serve"; "hang" answers nothing; "refuse" refuses everybody; "refer" names the brokers in "others"
    delay      seconds that every answer to a login takes
    log        file for a line per login and whatever is said
    device     name of its interface, "broker" unless given

Needs root."""
import fcntl
import ipaddress
import json
import os
import pathlib
import secrets
import select
import signal
import socket
import struct
import subprocess
import sys
import time
import warnings

with warnings.catch_warnings():
    warnings.simplefilter("ignore", DeprecationWarning)
    import crypt

WORDS = b"\0"
SOURCE, DESTINATION = slice(8, 24), slice(24, 40)  # of an IPv6 packet
TUNSETIFF, IFF_TUN, IFF_NO_PI = 0x400454CA, 0x0001, 0x1000


class Broker:
    def __init__(self, path):
        self.path = pathlib.Path(path)
        first = self.settings()
        self.network = ipaddress.IPv6Network(f"{first['prefix']}::/64")
        self.log = open(first["log"], "a", buffering=1)
        self.device = self.make_device(first.get("device", "broker"))
        self.socket = socket.socket(socket.AF_INET, socket.SOCK_DGRAM)
        self.socket.bind(tuple(first["listen"]))
        self.challenges, self.clients, self.late = {}, {}, []
        self.say_log("ready")

    def settings(self):
        return json.loads(self.path.read_text())

    def say_log(self, *words):
        print(*words, file=self.log)

    def make_device(self, name):
        device = os.open("/dev/net/tun", os.O_RDWR)
        fcntl.ioctl(device, TUNSETIFF, struct.pack("16sH22x", name.encode(), IFF_TUN | IFF_NO_PI))
        for words in (["addr", "add", f"{self.network[1]}/64", "dev", name], ["link", "set", name, "mtu", "1280", "up"]):
            subprocess.run(["ip", *words], check=True)
        return device

    def say(self, peer, words):
        self.socket.sendto(WORDS + words.encode(), peer)

    def answer_to(self, peer, words, settings):
        """What is said to a client that logs in; nothing for what is no login."""
        what, _, rest = words.partition(" ")
        if settings["mode"] == "refuse":
            return "refused not here"
        if settings["mode"] == "refer":
            return " ".join(["refer", *settings["others"]])
        if what == "hello" and rest == "anonymous":
            return self.welcome(peer) if settings["anonymous"] else "refused an account is needed"
        if what == "hello" and rest == "user":
            salt = self.challenges.setdefault(peer, secrets.token_hex(8))
            return f"challenge {salt}"
        if what == "login":
            return self.check(peer, rest, settings["accounts"])
        return None

    def check(self, peer, rest, accounts):
        salt, proof, user = (rest.split(" ", 2) + ["", ""])[:3]
        if peer in self.clients:  # it asks again, as the answer was late
            return self.welcome(peer)
        expected = crypt.crypt(accounts.get(user, secrets.token_hex(8)), f"$5${salt}$").rpartition("$")[2]
        if self.challenges.pop(peer, None) != salt or not secrets.compare_digest(expected, proof):
            return "refused wrong user or password"
        self.say_log("login of", user)
        return self.welcome(peer)

    def welcome(self, peer):
        if peer not in self.clients:
            taken = set(self.clients.values())
            self.clients[peer] = next(self.network[i] for i in range(2, 1000) if self.network[i] not in taken)
            self.say_log("client", self.clients[peer])
        return f"tunnel {self.clients[peer]} 64"

    def take_words(self, peer, words, settings):
        if words not in ("ping", "bye"):
            self.say_log("said:", words)
            answer = self.answer_to(peer, words, settings)
            if answer:
                self.late.append((time.monotonic() + settings["delay"], peer, answer))
        elif peer in self.clients:
            self.say_log(words, "of", self.clients[peer])
            if words == "ping":
                self.say(peer, "pong")
            else:
                del self.clients[peer]

    def take_datagram(self):
        datagram, peer = self.socket.recvfrom(65536)
        settings = self.settings()
        if settings["mode"] == "hang":
            return
        if datagram.startswith(WORDS):
            self.take_words(peer, datagram[1:].decode(errors="replace"), settings)
        elif len(datagram) >= 40 and self.clients.get(peer) == ipaddress.IPv6Address(datagram[SOURCE]):
            os.write(self.device, datagram)

    def take_packet(self):
        packet = os.read(self.device, 65536)
        if len(packet) >= 40 and packet[0] >> 4 == 6:
            to = ipaddress.IPv6Address(packet[DESTINATION])
            for peer, address in self.clients.items():
                if address == to:
                    self.socket.sendto(packet, peer)

    def send_late(self):
        due = [item for item in self.late if item[0] <= time.monotonic()]
        self.late = [item for item in self.late if item not in due]
        for _, peer, answer in due:
            self.say(peer, answer)

    def serve(self):
        try:
            while True:
                ready, _, _ = select.select([self.socket, self.device], [], [], 0.1 if self.late else None)
                if self.socket in ready:
                    self.take_datagram()
                if self.device in ready:
                    self.take_packet()
                self.send_late()
        finally:
            for peer in self.clients:
                self.say(peer, "bye")


if __name__ == "__main__":
    signal.signal(signal.SIGTERM, lambda *_: sys.exit(0))
    Broker(sys.argv[1]).serve()
