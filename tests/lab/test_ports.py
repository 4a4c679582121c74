# box: --no-network
"""Ports in use: sockets of both protocols and families, as the library, kovanet and the kernel see them."""

import contextlib
import ctypes
import socket
import struct

import pytest
from conftest import NO, USAGE, complaint, data, documented, kovanet, run
from sdk import library

TCP, UDP = 1, 2
FAMILIES = {"IPv4": (socket.AF_INET, "127.0.0.1"), "IPv6": (socket.AF_INET6, "::1")}


@pytest.fixture(scope="module", autouse=True)
def loopback():
    run("ip", "link", "set", "lo", "up")


@pytest.fixture(params=FAMILIES)
def family(request):
    return FAMILIES[request.param]


def is_used(low, high, protocol):
    return library.KOVANetIsPortRangeUsed(low, high, protocol)


def listening(low, high, protocol, room=65536):
    ports = (ctypes.c_int * room)()
    count = ctypes.c_int(room)
    assert library.KOVANetGetPortUsedInRange(ports, ctypes.byref(count), low, high, protocol) == 0
    return ports[: count.value]


@contextlib.contextmanager
def bound(family, kind, port=0):
    """A socket at a port of the loopback, by default one that the kernel chooses, which is given beside it."""
    with socket.socket(family[0], kind) as made:
        made.setsockopt(socket.SOL_SOCKET, socket.SO_REUSEADDR, 1)
        made.bind((family[1], port))
        yield made, made.getsockname()[1]


def test_listening_and_connected_tcp_sockets(family):
    with bound(family, socket.SOCK_STREAM) as (server, port):
        assert (is_used(port, port, TCP), listening(port, port, TCP)) == (0, [])  # bound alone is in no table
        server.listen()
        assert (is_used(port, port, TCP), is_used(port, port, UDP), listening(port, port, TCP)) == (1, 0, [port])
        with socket.create_connection((family[1], port)) as client, server.accept()[0] as accepted:
            accepted.setsockopt(socket.SOL_SOCKET, socket.SO_LINGER, struct.pack("ii", 1, 0))  # its end leaves no port in use
            own = client.getsockname()[1]
            assert (is_used(own, own, TCP), listening(own, own, TCP)) == (1, [])
            assert data("ports", "used", "tcp", own)["used"] is True
            assert data("ports", "list", "tcp", own, own) == []


def test_bound_and_connected_udp_sockets(family):
    with bound(family, socket.SOCK_DGRAM) as (server, port):
        assert (is_used(port, port, UDP), is_used(port, port, TCP), listening(port, port, UDP)) == (1, 0, [])
        with bound(family, socket.SOCK_DGRAM) as (client, own):
            client.connect(server.getsockname()[:2])
            assert (is_used(own, own, UDP), listening(own, own, UDP)) == (1, [])
    assert is_used(port, port, UDP) == 0


def test_a_port_of_both_families_is_listed_once_and_no_more_than_there_is_room_for():
    with contextlib.ExitStack() as sockets:
        ports = []
        for _ in range(3):
            _, port = listener = sockets.enter_context(bound(FAMILIES["IPv4"], socket.SOCK_STREAM))
            listener[0].listen()
            six, _ = sockets.enter_context(bound(FAMILIES["IPv6"], socket.SOCK_STREAM, port))
            six.listen()
            ports.append(port)
        found = listening(min(ports), max(ports), TCP)
        assert sorted(found) == sorted(ports)
        assert listening(min(ports), max(ports), TCP, room=2) == found[:2]
        assert data("ports", "list", "tcp", min(ports), max(ports)) == [
            {"protocol": "tcp", "port": port} for port in sorted(ports)]


def test_all_listeners_are_those_that_the_system_tells():
    with contextlib.ExitStack() as sockets:
        for family in FAMILIES.values():
            server, _ = sockets.enter_context(bound(family, socket.SOCK_STREAM))
            server.listen()
        told = {int(line.split()[3].rpartition(":")[2]) for line in run("ss", "-Hltn").stdout.splitlines()}
        assert set(listening(0, 65535, TCP)) == told
        assert {row["port"] for row in data("ports", "list", "tcp")} == told


def test_kovanet_tells_the_answer_as_text_and_exit_code():
    with bound(FAMILIES["IPv4"], socket.SOCK_STREAM) as (server, port):
        free = f"tcp port {port} is free\n"
        assert kovanet("ports", "used", "tcp", port, status=NO).stdout == free
        server.listen()
        assert kovanet("ports", "used", "tcp", port).stdout == f"tcp port {port} is used\n"
        assert kovanet("ports", "used", "tcp", port, 65535).stdout == f"a tcp port from {port} to 65535 is used\n"
        told = data("ports", "used", "tcp", port)
        assert told == {"protocol": "tcp", "low": port, "high": port, "used": True}
        assert list(told) == documented("kovanet ports used")
        shown = [line.split() for line in kovanet("ports", "list", "tcp", port, port).stdout.splitlines()]
        assert shown == [["PROTOCOL", "PORT"], ["tcp", str(port)]]
        assert documented("kovanet ports list") == ["protocol", "port"]
    told = data("ports", "used", "udp", 1, 2, status=NO)
    assert told == {"protocol": "udp", "low": 1, "high": 2, "used": False}
    assert kovanet("ports", "used", "udp", 1, 2, status=NO).stdout == "no udp port from 1 to 2 is used\n"


def test_kovanet_refuses_what_is_no_port_and_no_protocol():
    assert complaint("ports", "used", "tcp", 9, 8, status=NO) == "the lowest port, 9, is above the highest, 8"
    for words in (("used", "tcp", "65536"), ("used", "tcp", "x"), ("used", "tcp", "0x1"), ("list", "tcp", "--", "-1")):
        assert complaint("ports", *words, status=NO) == f'port "{words[-1]}" is not valid: it is a number from 0 to 65535'
    assert complaint("ports", "used", "sctp", "1", status=USAGE) == '"sctp" is none of tcp, udp; did you mean tcp?'
