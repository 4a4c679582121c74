# box: --link eth0 --link lan0 --link lan1
# needs: bonding bridge dummy veth vlan
"""Which interfaces there are and what state they are in, over one of every kind that an appliance has, compared with what
iproute2 says of the same kernel."""

import ctypes
import json
import pathlib

import pytest
from conftest import on_other_side, run, wait_for
from sdk import IfInfo, enumerated, interfaces, library, register

KOVANET = "/usr/bin/kovanet"
PHYSICAL, LOGICAL, LOGICAL_AND_BELOW = 1, 2, 8
NO_SOCKET, NOT_OF_THE_KIND = 0x3400, 0xBC00
UP, RUNNING, MASTER, SLAVE = 0x1, 0x40, 0x400, 0x800


def info(name):
    record = IfInfo()
    assert library.KOVANetIFGetInfo(name.encode(), ctypes.byref(record), None) == 0, register()
    return record


def ip_links():
    return {link["ifname"]: link for link in json.loads(run("ip", "-j", "-d", "addr", "show").stdout)}


def kernel_flags(name):
    return int(pathlib.Path(f"/sys/class/net/{name}/flags").read_text(), 16)


def has_carrier(link):
    return "LOWER_UP" in link["flags"] and link["operstate"] in ("UP", "UNKNOWN")


def mac(record):
    return ":".join(f"{byte:02x}" for byte in record.abMac)


# bond0 over lan0 and lan1, bond0.20 above it, eth0.10 above eth0, lbr0 with its port tap0, dummy0 and a pair of cables
MADE = """
link add bond0 type bond mode active-backup miimon 50
link set lan0 down
link set lan1 down
link set lan0 master bond0
link set lan1 master bond0
link set bond0 up
link add link bond0 name bond0.20 type vlan id 20
link set bond0.20 up
link add link eth0 name eth0.10 type vlan id 10
link set eth0.10 up
link add lbr0 type bridge
link add port0 type veth peer name port1
link set port0 master lbr0
link set port0 up
link set port1 up
link set lbr0 up
link add dummy0 type dummy
link set dummy0 up
addr add 10.20.0.1/24 dev bond0.20
addr add 10.10.0.1/16 dev eth0.10
addr add 10.30.0.1/24 dev lbr0
"""
EVERY = {"lo", "eth0", "eth0.10", "lan0", "lan1", "bond0", "bond0.20", "lbr0", "port0", "port1", "dummy0"}


@pytest.fixture(scope="module", autouse=True)
def one_of_every_kind():
    run("ip", "-batch", "-", input=MADE)
    wait_for(lambda: all(has_carrier(link) for link in ip_links().values()), what="carrier everywhere")
    yield
    for name in ("bond0.20", "bond0", "eth0.10", "lbr0", "port0", "dummy0"):
        run("ip", "link", "del", name)
    for name in ("lan0", "lan1"):
        run("ip", "link", "set", name, "up")


@pytest.fixture
def link_down():
    """Takes the other end of a cable down, and up again when the test ends."""
    taken = []

    def take(name):
        on_other_side("ip", "link", "set", name, "down")
        taken.append(name)

    yield take
    for name in taken:
        on_other_side("ip", "link", "set", name, "up")
    wait_for(lambda: all(has_carrier(link) for link in ip_links().values()), what="carrier everywhere")


def test_the_kernel_has_one_of_every_kind():
    links = ip_links()
    assert links.keys() == EVERY
    kinds = {name: link.get("linkinfo", {}).get("info_kind") for name, link in links.items()}
    assert kinds == {"lo": None, "eth0": "veth", "lan0": "veth", "lan1": "veth", "port0": "veth", "port1": "veth",
                     "eth0.10": "vlan", "bond0.20": "vlan", "bond0": "bond", "lbr0": "bridge", "dummy0": "dummy"}
    assert (links["eth0.10"]["link"], links["bond0.20"]["link"]) == ("eth0", "bond0")


def test_physical_cards_hold_bond_members_and_no_vlans():
    assert {"eth0", "lan0", "lan1"} <= interfaces(PHYSICAL).keys()
    assert not {"eth0.10", "bond0.20", "lo", "port0"} & interfaces(PHYSICAL).keys()


def test_logical_interfaces_hold_bonds_and_vlans_in_place_of_what_is_below():
    found = interfaces(LOGICAL).keys()
    assert {"eth0.10", "bond0.20"} <= found
    assert not {"eth0", "lan0", "lan1", "bond0", "lo", "port0"} & found
    assert {"eth0", "eth0.10", "bond0", "bond0.20"} <= interfaces(LOGICAL_AND_BELOW).keys()
    assert not {"lan0", "lan1", "lo"} & interfaces(LOGICAL_AND_BELOW).keys()


def test_enumeration_leaves_out_members_and_loopback():
    found = enumerated(library.KLIBNetInterfaceEnum, 0).keys()
    assert found == EVERY - {"lo", "lan0", "lan1", "port0"}


@pytest.mark.parametrize("kind", [PHYSICAL, LOGICAL, LOGICAL_AND_BELOW])
def test_records_agree_with_iproute2(kind):
    links = ip_links()
    found = interfaces(kind)
    assert found
    for name, record in found.items():
        link = links[name]
        assert mac(record) == link["address"]
        assert record.nFlags & 0xFFFF & ~RUNNING == kernel_flags(name) & 0xFFFF  # sysfs does not tell running
        assert bool(record.nFlags & RUNNING) == has_carrier(link)
        assert record.nLink == (2 if has_carrier(link) else 0)
        addresses = [one["local"] for one in link["addr_info"] if one["family"] == "inet"]
        assert record.szIP.decode() == (addresses[0] if addresses else "")


def test_one_interface_s_record_agrees_with_the_kernel():
    for name, link in ip_links().items():
        record = info(name)
        assert (record.szIfname.decode(), mac(record)) == (name, link["address"])
        assert record.nFlags & (UP | MASTER | SLAVE) == kernel_flags(name) & (UP | MASTER | SLAVE)
    assert info("bond0").nFlags & MASTER and info("lan0").nFlags & SLAVE and info("lan1").nFlags & SLAVE


def test_mask_of_a_vlan_is_its_own():
    assert (info("eth0.10").szIP, info("eth0.10").szMask) == (b"10.10.0.1", b"255.255.0.0")
    assert (info("bond0.20").szIP, info("bond0.20").szMask) == (b"10.20.0.1", b"255.255.255.0")


def test_only_bond_members_are_bonded():
    bonded = {name for name in EVERY if library.KOVANetIfIsBondingPassive(name.encode()) == 1}
    assert bonded == {"lan0", "lan1"}


def test_only_bridge_members_are_bridged():
    bridged = {name for name in EVERY if library.KLIBNetBridgeIfIsSlave(name.encode()) == 1}
    assert bridged == {"port0"}


def test_kind_of_an_interface():
    assert library.KOVANetIsDevTypeMatch(b"eth0", PHYSICAL) == 1
    assert library.KOVANetIsDevTypeMatch(b"bond0.20", LOGICAL) == 1
    assert library.KOVANetIsDevTypeMatch(b"bond0.20", PHYSICAL) == 0
    assert register()[0] == NOT_OF_THE_KIND


def test_link_of_what_is_there_and_of_what_is_not():
    assert {name: library.KOVANetIfIsLink(name.encode()) for name in EVERY} == dict.fromkeys(EVERY, 1)
    assert library.KOVANetIfIsLink(b"nope") == -1
    assert register()[0] == NO_SOCKET


def test_a_vlan_loses_its_link_with_the_card_below(link_down):
    link_down("eth0")
    wait_for(lambda: library.KOVANetIfIsLink(b"eth0.10") == 0, what="the VLAN without link")
    assert library.KOVANetIfIsLink(b"eth0") == 0
    assert interfaces(LOGICAL)["eth0.10"].nLink == 0 and not has_carrier(ip_links()["eth0.10"])
    assert library.KOVANetIfIsLink(b"bond0.20") == 1


def test_a_bond_keeps_its_link_until_the_last_member_loses_it(link_down):
    link_down("lan0")
    wait_for(lambda: library.KOVANetIfIsLink(b"lan0") == 0, what="the first member without link")
    active = pathlib.Path("/sys/class/net/bond0/bonding/active_slave")
    wait_for(lambda: active.read_text() == "lan1\n", what="the other member's turn")
    assert library.KOVANetIfIsLink(b"bond0") == 1
    link_down("lan1")
    wait_for(lambda: library.KOVANetIfIsLink(b"bond0.20") == 0, what="the bond's VLAN without link")
    assert library.KOVANetIfIsLink(b"bond0") == 0
    assert not has_carrier(ip_links()["bond0"])


@pytest.mark.parametrize("name", ["eth0.10", "bond0", "lbr0", "dummy0"])
def test_an_interface_goes_down_and_up(name):
    assert library.KLIBNetIfDown(name.encode()) == 0
    assert library.KOVANetIsIFUp(name.encode()) == 0 and "UP" not in ip_links()[name]["flags"]
    assert name not in enumerated(library.KLIBNetInterfaceEnum, 0)
    assert library.KLIBNetIfUp(name.encode()) == 0
    assert library.KOVANetIsIFUp(name.encode()) == 1 and "UP" in ip_links()[name]["flags"]
    wait_for(lambda: all(has_carrier(link) for link in ip_links().values()), what="carrier everywhere")
    run("ip", "link", "set", "bond0.20", "up")


def test_kovanet_shows_what_iproute2_shows():
    links = ip_links()
    shown = {link["name"]: link for link in json.loads(run(KOVANET, "link", "show", "--json").stdout)}
    assert shown.keys() == links.keys()
    for name, link in links.items():
        assert (shown[name]["up"], shown[name]["link"]) == ("UP" in link["flags"], "up" if has_carrier(link) else "down")
        assert (shown[name]["mtu"], shown[name]["mac"]) == (link["mtu"], link["address"])


def test_kovanet_card_list_holds_the_logical_interfaces():
    links = ip_links()
    cards = {card["name"]: card for card in json.loads(run(KOVANET, "card", "list", "--json").stdout)}
    assert cards.keys() == interfaces(LOGICAL).keys()
    for name, card in cards.items():
        addresses = [(one["local"], one["prefixlen"]) for one in links[name]["addr_info"] if one["family"] == "inet"]
        assert (card["address"], card["prefix"]) == (addresses[0] if addresses else (None, None))
        assert (card["mac"], card["mtu"], card["link"]) == (links[name]["address"], links[name]["mtu"], "up")
