# box: --link eth0 --link lan0 --link lan1
# needs: vlan bonding bridge dummy
"""kovanet vlan, bond, bridge and mtu, compared with what the kernel, the files and iproute2 say."""

import ctypes
import pathlib
import re

import pytest
from conftest import asked, on_other_side, run, wait_for
from sdk import core
from test_kovanet import (CALL_FAILED, DONE, KOVANET, NO, NO_PERMISSION, NOT_FOUND, SCRIPTS, USAGE, complaint, data,
                          default_gateway, documented, everything, interface_file, ip, kernel_addresses, keys, keys_of,
                          kovanet, link_of)

KOVAINFO = pathlib.Path("/etc/kovainfo.conf")
DHCPD = pathlib.Path("/etc/dhcpd")
CARDS = ("eth0", "lan0", "lan1")
# what is there to be read, on dummies; the cards are there to be changed
MADE = """
link add row0 type dummy
link set row0 up
link add link row0 name row0.10 type vlan id 10
link set row0.10 up
addr add 10.10.0.1/16 dev row0.10
link add bond7 type bond mode 802.3ad miimon 50
link add part0 type dummy
link add part1 type dummy
link set part1 master bond7
link set part0 master bond7
link set bond7 up
link add br7 type bridge
link add port0 type dummy
link set port0 master br7
link set port0 up
link set br7 up
link add lbr7 type bridge
link set lbr7 up
addr add 10.30.0.1/24 dev lbr7
"""
MADE_LINKS = ("row0", "bond7", "part0", "part1", "br7", "port0", "lbr7")


@pytest.fixture(scope="module", autouse=True)
def what_there_is():
    run("ip", "-batch", "-", input=MADE)
    wait_for_links("row0.10", "bond7", "br7")
    yield
    for name in MADE_LINKS:
        run("ip", "link", "del", name)


@pytest.fixture(autouse=True)
def cards():
    """The cards up and static, lan0 with an address; everything else in its place again afterwards."""
    kovainfo = KOVAINFO.read_bytes()
    on_other_side("ip", "addr", "replace", "10.9.0.1/24", "dev", "lan0")
    for name in CARDS:
        run("ip", "addr", "flush", "dev", name, "scope", "global")
        run("ip", "link", "set", name, "up")
        interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=static\n")
    run("ip", "addr", "add", "10.9.0.7/24", "dev", "lan0")
    with interface_file("lan0").open("a") as file:
        file.write("IPADDR=10.9.0.7\nNETMASK=255.255.255.0\n")
    interface_file("lbr7").write_text("DEVICE=lbr7\nTYPE=bridge\nPRIMARY=wlan0\nLOCAL_LAN=yes\n")
    wait_for_links(*CARDS)
    yield
    KOVAINFO.write_bytes(kovainfo)
    for path in SCRIPTS.glob("ifcfg-*"):
        path.unlink()


def wait_for_links(*names):
    """Until the kernel has told of all links, and given them the IPv6 addresses that come with them."""
    wait_for(lambda: all(link_of(name)["operstate"] == "UP" and kernel_addresses(name, "inet6") for name in names),
             what=f"the links of {names}")


def state_of(name):
    """Up, link and address as iproute2 tells them."""
    link = link_of(name)
    address, _, prefix = (kernel_addresses(name) or ["/"])[0].partition("/")
    return {"up": "UP" in link["flags"], "link": "up" if {"UP", "LOWER_UP"} <= set(link["flags"]) else "down",
            "address": address or None, "prefix": int(prefix) if prefix else None}


def mtus():
    return {link["ifname"]: link["mtu"] for link in ip("link", "show")}


# ---- reading --------------------------------------------------------------------------------------------------------


def test_vlan_list_and_show():
    expected = {"name": "row0.10", "row_device": "row0", "id": 10, **state_of("row0.10")}
    assert expected["address"] == "10.10.0.1"
    assert data("vlan", "list") == [expected]
    assert data("vlan", "show", "row0.10") == data("vlan", "show", "row0") == expected
    assert [line.split() for line in kovanet("vlan", "list").stdout.splitlines()] == [
        ["NAME", "ON", "ID", "STATE", "LINK", "ADDRESS"], ["row0.10", "row0", "10", "up", "up", "10.10.0.1/16"]]
    assert list(expected) == documented("kovanet vlan list")


def test_bond_list_and_show():
    expected = {"name": "bond7", "mode": "802.3ad", "members": ["part0", "part1"], "partner": False, **state_of("bond7")}
    assert data("bond", "list") == [expected]
    assert data("bond", "show", "bond7") == expected
    shown = dict(re.split(r": +", line) for line in kovanet("bond", "show", "bond7").stdout.splitlines())
    assert (shown["members"], shown["partner"], shown["address"]) == ("part0 part1", "none", "-")
    assert list(expected) == documented("kovanet bond list")


def test_bridges_are_listed_among_many_interfaces():
    run("ip", "-batch", "-", input="".join(f"link add many{i} type veth peer name aa{i}\n" for i in range(20)))
    try:
        assert {"br7", "lbr7"} <= {row["name"] for row in data("bridge", "list")}
    finally:
        run("ip", "-batch", "-", input="".join(f"link del many{i}\n" for i in range(20)))


def test_bridge_list_and_show():
    found = data("bridge", "list")
    assert found == [
        {"name": "br7", "role": "master", "ports": ["port0"], "configured_role": None, "configured_peer": None,
         **state_of("br7")},
        {"name": "lbr7", "role": "local-lan", "ports": [], "configured_role": "local-lan", "configured_peer": "wlan0",
         **state_of("lbr7")}]  # fmt: skip
    assert data("bridge", "show", "lbr7") == found[1]
    assert list(found[0]) == documented("kovanet bridge list")
    port = data("bridge", "show", "port0")
    assert (port["role"], port["configured_role"], port["ports"]) == ("slave", None, [])
    assert "configured: local-lan, first port wlan0\n" in kovanet("bridge", "show", "lbr7").stdout


def test_mtu_show_agrees_with_the_kernel():
    KOVAINFO.write_text(KOVAINFO.read_text() + 'lan0_mtu="9000"\neth0_mtu="much"\n')
    found = data("mtu", "show")
    assert {row["name"]: row["mtu"] for row in found} == mtus()
    assert {row["name"]: row["configured_mtu"] for row in found} == {**dict.fromkeys(mtus(), 1500), "lan0": 9000,
                                                                     "eth0": None}
    assert data("mtu", "show", "lan0") == [row for row in found if row["name"] == "lan0"]
    assert list(found[0]) == documented("kovanet mtu show")


def test_reading_needs_no_root():
    for words in (["vlan", "list"], ["bond", "list"], ["bridge", "list"], ["mtu", "show"]):
        assert run("unshare", "--user", KOVANET, *words).stdout == kovanet(*words).stdout


# ---- what is refused ------------------------------------------------------------------------------------------------

MANY = " ".join(f"if{number}" for number in range(33))
BAD = {
    "vlan": USAGE, "vlan creat lan0 10 dhcp": USAGE, "vlan show": USAGE, "vlan create lan0 10": USAGE,
    "vlan create lan0 10 bootp": USAGE, "vlan create lan0 10 static": USAGE,
    "vlan create lan0 10 static 10.9.0.9": USAGE, "vlan create lan0 10 dhcp 10.9.0.9/24": USAGE,
    "vlan create lan0 10 dhcp": "no terminal to ask on", "vlan remove row0.10 more": USAGE,
    "vlan create lan0 0 dhcp": "1 to 4094", "vlan create lan0 4095 dhcp": "1 to 4094",
    "vlan create lan0 10x dhcp": "1 to 4094", "vlan create lan0 99999999999 dhcp": "1 to 4094",
    "vlan create lan0 -1 dhcp": "1 to 4094", "vlan create lan0 4096 dhcp": "1 to 4094",
    "vlan create fifteen-letters 1 dhcp": "1 to 15 characters", "vlan create lan0 4094 dhcp": "no terminal to ask on",
    "vlan remove fifteen-letters": NOT_FOUND, "vlan remove sixteen-letters1": "1 to 15 characters",
    "vlan create a/b 10 dhcp": "holds no", "vlan create sixteen-letters1 10 dhcp": "1 to 15 characters",
    "vlan create thirteen-lett 10 dhcp": "1 to 15 characters", "vlan create lo 10 dhcp": "not a network card",
    "vlan create row0 20 dhcp": "has the VLAN row0.10 already", "vlan create row0.10 20 dhcp": "is a VLAN",
    "vlan create part0 10 dhcp": "member of a bond", "vlan create port0 10 dhcp": "port of a bridge",
    "vlan create br7 10 dhcp": "is not configured here", "vlan create eth0 10 keep": "no IPv4 configuration to keep",
    "vlan create eth0 10 static 10.9.0.255/24": "broadcast", "vlan create eth0 10 static 10.9.0.9/33": "1 to 32",
    "vlan create eth0 10 static 10.9.0.7/24": "it is the address of lan0",
    "vlan create nope 10 dhcp": NOT_FOUND, "vlan remove nope": NOT_FOUND, "vlan remove row0": "has one: row0.10",
    "vlan remove lan0": NOT_FOUND, "vlan show lan0": NOT_FOUND, "vlan remove row0.10": "is not configured here",

    "bond": USAGE, "bond create": USAGE, "bond create bond1 802.3ad": USAGE, "bond show": USAGE,
    "bond create bond1 802.3 eth0 lan0": "did you mean 802.3ad?", "bond create bond1 lacp eth0 lan0": "the modes are",
    "bond create bond1 balance-rr-x eth0 lan0": "did you mean balance-rr?",
    "bond create bond1 balance-tcp eth0 lan0": "virtual switch", "bond create bond1 802.3ad eth0": "at least two",
    "bond create bond1 802.3ad eth0 eth0": "named twice", f"bond create bond1 802.3ad {MANY}": "at most 32",
    "bond create sixteen-letters1 802.3ad eth0 lan0": "1 to 15 characters",
    "bond create 1bond 802.3ad eth0 lan0": "begins with a letter", "bond create b.1 802.3ad eth0 lan0": "begins with",
    "bond create ovs_bond1 802.3ad eth0 lan0": "virtual switch's", "bond create bond7 802.3ad eth0 lan0": "bond change",
    "bond create eth0 802.3ad lan0 lan1": "named eth0 already", "bond create bond1 802.3ad eth0 a/b": "holds no",
    "bond create bond1 802.3ad eth0 lo": "not a network card", "bond create bond1 802.3ad eth0 part0": "member of a bond",
    "bond create bond1 802.3ad eth0 port0": "port of a bridge", "bond create bond1 802.3ad eth0 row0.10": "is a VLAN",
    "bond create bond1 802.3ad eth0 row0": "has the VLAN row0.10", "bond create bond1 802.3ad eth0 bond7": "itself",
    "bond create bond1 802.3ad eth0 br7": "itself", "bond create bond1 802.3ad eth0 nope": NOT_FOUND,
    "bond create bond1 802.3ad eth0 lan0": "no terminal to ask on", "bond change bond7 802.3ad": "is not configured here",
    "bond change eth0 802.3ad": NOT_FOUND, "bond delete nope": NOT_FOUND, "bond show eth0": NOT_FOUND,
    "bond delete bond7": "is not configured here",

    "bridge": USAGE, "bridge show": USAGE, "bridge set br1": USAGE, "bridge set br1 hub lan0": USAGE,
    "bridge set br1 master": "needs the first port", "bridge set lan0 slave": "needs the bridge",
    "bridge set lan0 slave br7 dhcp": "a port has no address", "bridge set br1 master lan0 dchp": "neither static nor dhcp",
    "bridge set br1 master lan0 static 10.9.0.9": USAGE, "bridge set br1 master lan0 dhcp more": "one word too many",
    "bridge set lan0 none lan1": "neither static nor dhcp", "bridge set br1 master lan0": "no terminal to ask on",
    "bridge set br1 master lan0 static 10.9.0.9/0": "1 to 32", "bridge set a/b master lan0": "holds no",
    "bridge set sixteen-letters1 master lan0": "1 to 15 characters", "bridge set br1 master br1": "part of itself",
    "bridge set lan1 master lan0": "cannot become a bridge", "bridge set br7 slave lbr7": "is a bridge itself",
    "bridge set row0 slave br7": "has the VLAN row0.10", "bridge set part0 slave br7": "member of a bond",
    "bridge set lo slave br7": "not a network card", "bridge set nope slave br7": NOT_FOUND,
    "bridge set lan0 slave br1": "bridge set br1 master PRIMARY", "bridge set br1 master nope": NOT_FOUND,
    "bridge set nope none": NOT_FOUND, "bridge show nope": NOT_FOUND,

    "mtu": USAGE, "mtu shw": "did you mean show?", "mtu set lan0": USAGE, "mtu set lan0 67": "68 to 65535",
    "mtu set lan0 65536": "68 to 65535", "mtu set lan0 -1": "68 to 65535", "mtu set lan0 1500b": "68 to 65535",
    "mtu set lan0 0": "68 to 65535", "mtu set lan0 99999999999999999999": "68 to 65535", "mtu set lan0 ''": "68 to 65535",
    "mtu set fifteen-letters 1500": NOT_FOUND, "mtu show sixteen-letters1": "1 to 15 characters",
    "mtu set nope 1500": NOT_FOUND, "mtu show nope": NOT_FOUND, "mtu set lo 1500": "loopback",
    "mtu set a/b 1500": "holds no", "mtu set lan0 1500": "no terminal to ask on",
}  # fmt: skip
# words whose refusal is no matter of a value
BAD_USAGE = ("no terminal to ask on", "did you mean", "the modes are", "needs the", "a port has no", "neither static",
             "one word too many")
BAD_NAME = ("has one: row0.10", "bridge set br1 master PRIMARY")


def status_of(expected):
    """The exit code for what is expected of a line of BAD."""
    if isinstance(expected, int):
        return expected
    return USAGE if expected.startswith(BAD_USAGE) else NOT_FOUND if expected in BAD_NAME else NO


@pytest.mark.parametrize("first", ["vlan", "bond", "bridge", "mtu"])
def test_bad_input_is_explained_and_changes_nothing(first):
    before, tried = everything(), 0
    for words, expected in BAD.items():
        if words.split()[0] == first:
            text = complaint(*words.split(), status=status_of(expected))
            assert isinstance(expected, int) or expected in text, words
            tried += 1
    assert everything() == before
    assert tried > 10


def test_changes_need_root():
    before = everything()
    for words in ("vlan create lan0 10 keep --yes", "vlan remove row0.10 --yes", "bond create bond1 802.3ad eth0 lan1 --yes",
                  "bond change bond7 802.3ad --yes", "bond delete bond7 --yes", "bridge set br1 master lan0 --yes",
                  "mtu set lan0 1400 --yes"):  # fmt: skip
        done = run("unshare", "--user", KOVANET, *words.split(), status=NO_PERMISSION)
        assert done.stdout == "" and "needs root" in done.stderr
    assert everything() == before


# ---- the question ---------------------------------------------------------------------------------------------------


@pytest.mark.parametrize("words,effects", [
    ("vlan create lan0 10 keep", ["lan0.10 is made on lan0 and gets the address 10.9.0.7 mask 255.255.255.0.",
                                  "lan0 loses its address 10.9.0.7/24 and has none while the VLAN is there; its IPv6 "
                                  "settings move to lan0.10, too.",
                                  "Connections over lan0 end."]),
    ("bond create bond1 active-backup lan1 lan0", [
        "bond1 is made of lan0, lan1 and gets from lan0 the address 10.9.0.7 mask 255.255.255.0.",
        "lan0 loses its address 10.9.0.7/24.", "lan1 loses its addresses.", "Connections over these interfaces end."]),
    ("bridge set br1 master lan0 static 10.9.0.9/24", [
        "From the next start of the network on, br1 is the bridge with the first port lan0 and has the address 10.9.0.9 "
        "mask 255.255.255.0.", "Until then everything stays as it is."]),
    ("mtu set row0.10 1400", ["row0 and row0.10 get the MTU 1400 and go down for a moment.",
                              "IPv4 addresses and the default gateway stay; IPv6 addresses that were added by hand are "
                              "lost.", "Connections over row0 and row0.10 pause."]),
    ("mtu set row0 9000", ["The MTU 9000 of row0 is stored, but not used now: the link is slower than 1000 Mb/s, or its "
                           "speed is not known.", "Addresses stay as they are."]),
])  # fmt: skip
def test_a_change_says_what_it_will_do_and_does_nothing_without_a_yes(words, effects):
    before = everything()
    for answer in (b"\n", b"no\n", b"\x04") if words.startswith("vlan") else (b"n\n",):
        status, said = asked(*words.split(), answer=answer)
        assert status == NO
        assert said.startswith("\n".join([*effects, "Continue? [y/N] "]))
        assert said.endswith("kovanet: nothing was changed\n")
    assert everything() == before


# ---- bridges --------------------------------------------------------------------------------------------------------


def test_bridge_set_writes_the_files_and_nothing_else():
    links = mtus()
    assert asked("bridge", "set", "br1", "master", "lan0", "static", "10.9.0.9/24", answer=b"y\n")[0] == DONE
    assert keys("br1") == {"DEVICE": "br1", "TYPE": "bridge", "PRIMARY": "lan0", "ONBOOT": "yes", "BOOTPROTO": "static",
                           "IPADDR": "10.9.0.9", "NETMASK": "255.255.255.0"}
    before = keys("lan0")
    kovanet("bridge", "set", "lan0", "slave", "br1", "--yes")
    assert keys("lan0") == {**before, "BRIDGE": "br1"}
    shown = data("bridge", "show", "lan0")
    assert (shown["role"], shown["configured_role"], shown["configured_peer"]) == ("none", "slave", "br1")
    assert "port of a bridge already" in complaint("vlan", "create", "lan0", "10", "dhcp", status=NO)
    kovanet("bridge", "set", "br1", "local-lan", "lan1", "dhcp", "--yes")
    assert keys("br1") == {"DEVICE": "br1", "TYPE": "bridge", "PRIMARY": "lan1", "LOCAL_LAN": "yes", "ONBOOT": "yes",
                           "BOOTPROTO": "dhcp"}
    shown = data("bridge", "show", "br1")
    assert (shown["role"], shown["up"], shown["configured_role"]) == (None, False, "local-lan")
    kovanet("bridge", "set", "lan0", "none", "--yes")
    assert keys("lan0") == before
    assert mtus() == links and kernel_addresses("lan0") == ["10.9.0.7/24"]


# ---- MTU ------------------------------------------------------------------------------------------------------------


def test_mtu_set_changes_kernel_and_file_and_keeps_the_gateway():
    run("ip", "route", "add", "default", "via", "10.9.0.1")
    status, said = asked("mtu", "set", "lan0", "9000", answer=b"y\n")
    assert status == DONE and "setting the MTU of lan0, this takes five seconds ..." in said
    assert said.endswith("\r\x1b[K"), "the note is gone"
    assert (mtus()["lan0"], keys_of(KOVAINFO)["lan0_mtu"]) == (9000, '"9000"')
    assert kernel_addresses("lan0") == ["10.9.0.7/24"] and default_gateway() == ("10.9.0.1", "lan0")
    kovanet("mtu", "set", "lan0", "1500", "--yes")
    assert data("mtu", "show", "lan0") == [{"name": "lan0", "mtu": 1500, "configured_mtu": 1500}]


def test_mtu_of_a_vlan_is_its_row_device_s_too():
    kovanet("mtu", "set", "row0.10", "1400", "--yes")
    assert (mtus()["row0"], mtus()["row0.10"]) == (1400, 1400)
    assert (keys_of(KOVAINFO)["row0_mtu"], keys_of(KOVAINFO)["row0.10_mtu"]) == ('"1400"', '"1400"')
    assert kernel_addresses("row0.10") == ["10.10.0.1/16"]


def test_mtu_that_the_link_is_too_slow_for_is_stored():
    kovanet("mtu", "set", "port0", "9000", "--yes")
    assert data("mtu", "show", "port0") == [{"name": "port0", "mtu": 1500, "configured_mtu": 9000}]


def test_mtu_that_the_kernel_refuses_is_not_kept():
    run("ip", "link", "add", "link", "lan0", "name", "twin0", "type", "macvlan")
    run("ip", "link", "set", "twin0", "up")
    try:
        before = KOVAINFO.read_text()
        text = complaint("mtu", "set", "twin0", "9000", "--yes", status=CALL_FAILED)
        assert text.startswith("cannot set the MTU of twin0 to 9000: NET_ERR_SYSCALL (0x8100) in net_set_mtu_eth")
        assert data("mtu", "show", "twin0") == [{"name": "twin0", "mtu": 1500, "configured_mtu": 1500}]
        assert KOVAINFO.read_text() == before, "no setting is made where there was none"
        KOVAINFO.write_text('twin0_mtu="1400"\n')
        complaint("mtu", "set", "twin0", "9000", "--yes", status=CALL_FAILED)
        assert KOVAINFO.read_text() == 'twin0_mtu="1400"\n'
        run("ip", "link", "add", "link", "twin0", "name", "twin0.5", "type", "vlan", "id", "5")
        run("ip", "link", "set", "twin0.5", "up")
        complaint("mtu", "set", "twin0.5", "9000", "--yes", status=CALL_FAILED)
        assert KOVAINFO.read_text() == 'twin0_mtu="1400"\n'
    finally:
        run("ip", "link", "del", "twin0")


# ---- VLANs ----------------------------------------------------------------------------------------------------------


def test_vlan_create_and_remove():
    kovanet("vlan", "create", "lan0", "20", "static", "10.9.020.5/24", "--yes")
    [shown] = [vlan for vlan in data("vlan", "list") if vlan["name"] == "lan0.20"]
    assert shown == {"name": "lan0.20", "row_device": "lan0", "id": 20, **state_of("lan0.20")}
    assert kernel_addresses("lan0.20") == ["10.9.16.5/24"] and kernel_addresses("lan0") == []
    assert keys("lan0.20") == {"DEVICE": "lan0.20", "VLAN_ROW_DEVICE": "lan0", "VLAN_ID": "20", "ONBOOT": "yes",
                               "BOOTPROTO": "static", "IPADDR": "10.9.16.5", "NETMASK": "255.255.255.0"}
    assert keys("lan0") == {"DEVICE": "lan0", "ONBOOT": "yes", "BOOTPROTO": "none", "IPV6INIT": "off"}
    before = everything()
    assert "has the VLAN lan0.20 already" in complaint("vlan", "create", "lan0", "21", "dhcp", "--yes", status=NO)
    assert "has the VLAN lan0.20 already" in complaint("bond", "create", "bond1", "balance-rr", "lan0", "lan1", "--yes",
                                                       status=NO)
    assert everything() == before

    status, said = asked("vlan", "remove", "lan0.20", answer=b"yes\n")
    assert status == DONE
    assert said.startswith("lan0.20 loses its address 10.9.16.5/24 and is removed.\nlan0 gets its IPv6 settings and the "
                           "address 10.9.16.5 mask 255.255.255.0.\nConnections over lan0.20 end.\n")
    assert "removing lan0.20, this takes a few seconds ..." in said
    assert "lan0.20" not in mtus() and not interface_file("lan0.20").exists()
    assert kernel_addresses("lan0") == ["10.9.16.5/24"] and keys("lan0")["BOOTPROTO"] == "static"


def test_vlan_create_keep_takes_the_address_of_the_interface():
    kovanet("vlan", "create", "lan0", "4094", "keep", "--yes")
    assert kernel_addresses("lan0.4094") == ["10.9.0.7/24"] and kernel_addresses("lan0") == []
    kovanet("vlan", "remove", "lan0.4094", "--yes")
    assert kernel_addresses("lan0") == ["10.9.0.7/24"]


@pytest.fixture
def idle_network_script(keep):
    """A network script that says that all is done, and does nothing."""
    keep("/etc/rc.network").write_text("#!/bin/sh\nexit 0\n")


def test_a_kernel_that_does_not_follow_is_a_failure(idle_network_script):
    assert "the kernel has no such VLAN" in complaint("vlan", "create", "lan0", "20", "keep", "--yes", status=CALL_FAILED)
    assert "the kernel has another bond or none" in complaint("bond", "create", "bond1", "balance-rr", "eth0", "lan1",
                                                              "--yes", status=CALL_FAILED)


def test_changes_wait_for_each_other():
    before, held = everything(), ctypes.c_int()
    assert core.KLIBCFileLockTimeByFile(str(SCRIPTS).encode(), 1, 5, ctypes.byref(held)) == 0
    try:
        for words in ("vlan create lan0 20 keep", "bond create bond1 balance-rr eth0 lan1"):
            text = complaint(*words.split(), "--yes", status=CALL_FAILED)
            assert text.startswith("cannot lock the interfaces: NET_ERR_LOCK (0x400)")
    finally:
        core.KLIBCFileUnlockByFile(held)
    assert everything() == before


# ---- bonds ----------------------------------------------------------------------------------------------------------


@pytest.fixture
def served(keep):
    """served(name): the DHCP server's switch of an interface, with what is kept of it; lan0's and lan1's are on."""
    DHCPD.mkdir(exist_ok=True)
    for name in ("lan0", "lan1"):
        keep(DHCPD / f"dhcpd-{name}.info").write_text('enable="yes"\n')
    return lambda name: keys_of(DHCPD / f"dhcpd-{name}.info")


KEPT, ON_AGAIN = {"enable": '"no"', "bonding_backup_enable": '"yes"'}, {"enable": '"yes"', "bonding_backup_enable": '"yes"'}


def test_bond_create_change_and_delete(served):
    run("ip", "link", "add", "bond1", "type", "bond")  # without members, as the driver makes one when it is loaded
    kovanet("bond", "create", "bond1", "active-backup", "lan1", "lan0", "--yes")
    [shown] = [bond for bond in data("bond", "list") if bond["name"] == "bond1"]
    assert shown == {"name": "bond1", "mode": "active-backup", "members": ["lan0", "lan1"], "partner": None,
                     **state_of("bond1")}
    assert (kernel_addresses("bond1"), kernel_addresses("lan0")) == (["10.9.0.7/24"], [])
    assert keys("bond1")["IPADDR"] == "10.9.0.7" and keys("lan1")["MASTER"] == "bond1"
    assert served("lan0") == served("lan1") == KEPT
    before = everything()
    kovanet("bond", "change", "bond1", "active-backup")
    assert "member of a bond" in complaint("vlan", "create", "lan0", "10", "dhcp", status=NO)
    assert everything() == before

    interface_file("eth0").write_text("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=none\n")
    status, said = asked("bond", "change", "bond1", "balance-rr", "eth0", "lan1", answer=b"n\n")
    assert status == NO and "and gets from eth0 an address from a DHCP server.\n" in said
    interface_file("eth0").write_text("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\n")
    status, said = asked("bond", "change", "bond1", "balance-rr", "eth0", "lan1", answer=b"y\n")
    assert status == DONE
    assert said.startswith(
        "bond1 becomes a bond of mode balance-rr of eth0, lan1.\n"
        "bond1 gives up the address 10.9.0.7 mask 255.255.255.0 and gets from eth0 no IPv4 address.\n"
        "eth0 loses its addresses.\nlan0 leaves and gets the address 10.9.0.7 mask 255.255.255.0.\n"
        "Connections over bond1 end.\n")
    shown = data("bond", "show", "bond1")
    assert (shown["mode"], shown["members"], shown["address"]) == ("balance-rr", ["eth0", "lan1"], None)
    assert kernel_addresses("lan0") == ["10.9.0.7/24"]
    assert (served("lan0"), served("lan1")) == (ON_AGAIN, KEPT)

    kovanet("bond", "delete", "bond1", "--yes")
    assert "bond1" not in [bond["name"] for bond in data("bond", "list")] and not interface_file("bond1").exists()
    assert not {"MASTER", "SLAVE"} & (keys("eth0").keys() | keys("lan1").keys())
    assert served("lan1") == ON_AGAIN


def test_a_change_that_fails_halfway_is_told(served, keep):
    keep("/usr/kova/bin/kovafirewall").write_text("#!/bin/sh\nexit 1\n")
    text = complaint("vlan", "create", "lan0", "20", "keep", "--yes", status=CALL_FAILED)
    assert text.startswith("cannot make lan0.20 whole, what was done stays (kovanet vlan list): ")
    assert (kernel_addresses("lan0.20"), kernel_addresses("lan0")) == (["10.9.0.7/24"], [])
    text = complaint("vlan", "remove", "lan0.20", "--yes", status=CALL_FAILED)
    assert text.startswith("cannot remove lan0.20 wholly, what was done stays (kovanet vlan list): ")
    assert "lan0.20" not in mtus() and not interface_file("lan0.20").exists()
    assert kernel_addresses("lan0") == ["10.9.0.7/24"]

    unreadable = DHCPD / "dhcpd-lan0.info"
    unreadable.unlink()
    unreadable.mkdir()
    try:
        text = complaint("bond", "create", "bond1", "active-backup", "lan0", "lan1", "--yes", status=CALL_FAILED)
    finally:
        unreadable.rmdir()
    assert text.startswith("the bond is changed, but the DHCP server's switches could not be moved: ")
    shown = data("bond", "show", "bond1")
    assert (shown["members"], shown["up"], shown["address"]) == (["lan0", "lan1"], True, "10.9.0.7")
    assert served("lan1") == {"enable": '"yes"'}
    kovanet("bond", "delete", "bond1", "--yes")


def test_a_kernel_that_keeps_what_is_gone_is_a_failure(idle_network_script):
    run("ip", "-batch", "-", input="link add link lan0 name lan0.20 type vlan id 20\nlink add bond1 type bond\n"
                                   "link set lan1 down\nlink set lan1 master bond1\n")  # fmt: skip
    interface_file("lan0.20").write_text("DEVICE=lan0.20\nVLAN_ROW_DEVICE=lan0\nVLAN_ID=20\nBOOTPROTO=dhcp\n")
    interface_file("bond1").write_text("DEVICE=bond1\nBOOTPROTO=static\nBONDING_OPTS=\"mode=0\"\n")
    try:
        text = complaint("vlan", "remove", "lan0.20", "--yes", status=CALL_FAILED)
        assert text == ("the file of lan0.20 is gone, but the kernel still has it; see what /etc/rc.network restart lan0 "
                        "says")
        text = complaint("bond", "delete", "bond1", "--yes", status=CALL_FAILED)
        assert text == ("the file of bond1 is gone, but the kernel still has the bond; see what /etc/rc.network restart "
                        "lan1 says")
        assert not interface_file("lan0.20").exists() and not interface_file("bond1").exists()
    finally:
        run("ip", "link", "del", "lan0.20")
        run("ip", "link", "del", "bond1")


# ---- help -----------------------------------------------------------------------------------------------------------

VERBS = {"vlan": ["", "list", "show", "create", "remove"], "bond": ["", "list", "show", "create", "change", "delete"],
         "bridge": ["", "list", "show", "set"], "mtu": ["", "show", "set"]}


@pytest.mark.parametrize("name,verbs", VERBS.items())
def test_help_has_examples_and_exit_codes(name, verbs):
    for verb in verbs:
        printed = kovanet(*[name, verb][: 1 + bool(verb)], "--help").stdout
        assert f"Usage: kovanet {name} {verb}".rstrip() in printed
        assert "Examples:\n  kovanet " in printed and "5 needs root" in printed
        if verb in ("create", "change", "remove", "delete", "set"):
            assert "--yes" in printed
