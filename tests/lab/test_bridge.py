# box: --link eth0 --link lan0 --link lan1
# needs: bridge
"""Bridges: written as files by the library, made by the network script, and read from files and kernel alike."""

import ctypes
import pathlib
import socket
import struct

import pytest
from capture import captured, in_order, send
from conftest import addresses, is_up, on_other_side, run, wait_for
from sdk import STATIC, BridgeInfo, NetInfo, card, core, library, register

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
PLAIN, MASTER, LOCAL_LAN, PORT = 1, 2, 3, 4
LINKS = ("lan0", "lan1")
EXPERIMENTAL = 0x88B5

core.KLIBCSzListAlloc.restype = ctypes.c_void_p
core.KLIBCSzListGet.restype = ctypes.c_char_p


class Names:
    """A list of the platform, filled by a call."""

    def __init__(self, call):
        handle = ctypes.c_void_p(core.KLIBCSzListAlloc(16))
        self.answer = call(handle)
        count = ctypes.cast(handle, ctypes.POINTER(ctypes.c_int32))[1]
        self.names = [core.KLIBCSzListGet(handle, i).decode() for i in range(count)]
        core.KLIBCSzListFree(handle)


def ports_of(bridge):
    return sorted(Names(lambda names: library.KLIBNetBridgeSlaveEnum(bridge.encode(), names)).names)


def bridges(kind):
    found = Names(lambda names: library.KLIBNetEnumBridge(names, kind))
    assert found.answer == len(found.names)
    return found.names


def kernel_role(name):
    found = BridgeInfo()
    assert library.KLIBNETGetBridgeInfo(name.encode(), ctypes.byref(found)) == found.nType
    return found.nType, found.szPeer.decode()


def file_role(name):
    found, ip = BridgeInfo(), NetInfo()
    assert library.KOVANetGetBridgeConfig(name.encode(), ctypes.byref(ip), ctypes.byref(found)) == 0, register()
    return found.nType, found.szPeer.decode()


def write(role, name, peer="", address=""):
    ip = card(STATIC, name, address, "255.255.255.0") if address else None
    if ip:
        ip.blLinkUp = 1
    record = BridgeInfo(nType=role, szIfname=name.encode(), szPeer=peer.encode())
    assert library.KOVANetSetBridgeConfig(ctypes.byref(ip) if ip else None, ctypes.byref(record)) == 0, register()


def network(verb, *names):
    run("/etc/rc.network", verb, *names)


@pytest.fixture(autouse=True)
def running_links():
    """Two links with an address each, and no bridge."""
    for number, link in enumerate(LINKS):
        write(PLAIN, link, address=f"192.168.8{number}.5")
    network("start", *LINKS)
    yield
    network("stop", *(name for name in ("lbr0", *LINKS) if (SCRIPTS / f"ifcfg-{name}").exists()))
    for file in SCRIPTS.glob("ifcfg-*"):
        if file.name != "ifcfg-eth0":
            file.unlink()
    assert not pathlib.Path("/sys/class/net/lbr0").exists()


def make_bridge(role=LOCAL_LAN):
    network("stop", *LINKS)
    write(role, "lbr0", "lan1", "192.168.90.5")
    for link in LINKS:
        write(PORT, link, "lbr0")
    network("start", "lbr0")


def hardware_address(name):
    return pathlib.Path(f"/sys/class/net/{name}/address").read_text()


@pytest.mark.parametrize("role", [MASTER, LOCAL_LAN])
def test_kernel_and_files_agree_on_the_roles(role):
    assert [(file_role(link), kernel_role(link)) for link in LINKS] == [((PLAIN, ""), (PLAIN, ""))] * 2
    make_bridge(role)
    for read in (file_role, kernel_role):
        assert read("lbr0") == (role, "lan1")
        assert [read(link) for link in LINKS] == [(PORT, "lbr0")] * 2
    assert ports_of("lbr0") == ["lan0", "lan1"]
    assert (bridges(role), bridges(MASTER + LOCAL_LAN - role), bridges(PORT)) == (["lbr0"], [], [])
    assert library.KOVANetIsIfBridgeType(b"lbr0", role) == 1
    assert library.KLIBNetBridgeIfIsMaster(b"lbr0") == 1 and library.KLIBNetBridgeIfIsSlave(b"lbr0") == 0
    assert library.KLIBNetBridgeIfIsSlave(b"lan0") == 1 and library.KLIBNetBridgeIfIsMaster(b"lan0") == 0

    run("ip", "link", "set", "lbr0", "down")
    assert library.KLIBNETGetBridgeInfo(b"lbr0", None) == 0


def test_a_bridge_has_the_address_and_its_ports_none():
    make_bridge()
    assert [addresses(name) for name in ("lbr0", *LINKS)] == [["192.168.90.5/24"], [], []]
    assert all(is_up(name) for name in ("lbr0", *LINKS))
    assert hardware_address("lbr0") == hardware_address("lan1")
    for link in LINKS:  # from either side
        on_other_side("ip", "addr", "add", "192.168.90.1/24", "dev", link)
        run("ping", "-c", "1", "-W", "5", "192.168.90.1")
        on_other_side("ip", "addr", "flush", "dev", link)
        run("ip", "neigh", "flush", "dev", "lbr0")


def frame(text):
    return b"\xff" * 6 + b"\x02\0\0\0\0\x07" + struct.pack("!H", EXPERIMENTAL) + text.ljust(50)


def reaches(wanted, frames):
    """Whether a frame that the appliance itself sends to lan1 has reached its other side."""
    with socket.socket(socket.AF_PACKET, socket.SOCK_RAW) as packets:
        packets.bind(("lan1", 0))
        packets.send(wanted)
    return any(seen.content == wanted for seen in frames)


def is_passed_on(text):
    """Whether frames from the other side of lan0 reach that of lan1, which gets a last frame in any case."""
    with captured("lan1") as frames, in_order():
        for _ in range(20):
            send("lan0", frame(text))
        wait_for(lambda: reaches(frame(b"the last one"), frames), what="the last frame")
    return any(seen.content == frame(text) for seen in frames)


def test_a_frame_passes_from_port_to_port_and_not_without_the_bridge():
    assert not is_passed_on(b"before")
    make_bridge()
    wait_for(lambda: is_passed_on(b"between"), what="a frame")  # the bridge takes a moment to see that its ports have links
    network("stop", "lbr0")
    run("ip", "-batch", "-", input="link set lan0 up\nlink set lan1 up\n")
    assert not is_passed_on(b"after")


def test_ports_come_back_when_the_bridge_does():
    make_bridge()
    network("restart", "lbr0")
    assert ports_of("lbr0") == ["lan0", "lan1"]
    network("stop", "lan0")
    assert ports_of("lbr0") == ["lan1"]
    network("start", "lan0")
    for _ in range(2):
        network("start", "lbr0", *LINKS)
        assert ports_of("lbr0") == ["lan0", "lan1"]
        assert addresses("lbr0") == ["192.168.90.5/24"]


def test_a_port_leaves_for_an_address_of_its_own():
    make_bridge()
    alone = card(STATIC, "lan0", "192.168.80.5", "255.255.255.0")
    assert library.KOVANetDisableBridgeSlave(ctypes.byref(alone)) == 0, register()
    assert (file_role("lan0"), kernel_role("lan0")) == ((PLAIN, ""), (PORT, ""))  # the kernel does not know yet
    network("start", "lan0")
    assert kernel_role("lan0") == (PLAIN, "")
    assert (ports_of("lbr0"), addresses("lan0")) == (["lan1"], ["192.168.80.5/24"])


def test_a_bridge_is_not_made_in_place_of_another_interface(system_log):
    (SCRIPTS / "ifcfg-lan0").write_text("TYPE=bridge\nBOOTPROTO=none\n")
    index = pathlib.Path("/sys/class/net/lan0/ifindex").read_text()
    for verb in ("start", "stop"):
        told = run("/etc/rc.network", verb, "lan0", "lan1", status=1).stderr
        assert "lan0: there is an interface of another kind by this name" in told
        assert pathlib.Path("/sys/class/net/lan0/ifindex").read_text() == index
    assert not is_up("lan1")
    wait_for(lambda: system_log.holds("lan0: there is an interface of another kind"), what="the message")
    write(PLAIN, "lan0")
