# box: --link eth0 --link lan0 --link lan1
# needs: vlan bonding bridge dummy
"""kovanet show and verify on a machine with everything, compared with what iproute2 and the files say."""

import ipaddress
import json
import os
import pathlib

import pytest
from conftest import CALL_FAILED, DONE, NO, USAGE, complaint, data, documented, kovanet, run, wait_for
from test_kovanet import NETWORK, SCRIPTS, interface_file, ip, link_of
from verify_lab import differences

KOVAINFO = pathlib.Path("/etc/kovainfo.conf")
MADE = """
link add part0 type dummy
link add part1 type dummy
link add bond7 type bond mode 802.3ad use_carrier 0 miimon 100 updelay 100 lacp_rate fast
link set part0 master bond7
link set part1 master bond7
link add br7 type bridge
link set bond7 master br7
link set bond7 up
link set br7 up
addr add 10.30.0.1/24 dev br7
addr add 2001:db8:30::1/64 dev br7 nodad
link add row0 type dummy
link set row0 up
link add link row0 name row0.10 type vlan id 10
link set row0.10 up
addr add 10.10.0.1/16 dev row0.10
"""
FILES = {
    "part0": "MASTER=bond7\nSLAVE=yes\n",
    "part1": "MASTER=bond7\nSLAVE=yes\n",
    "bond7": 'BRIDGE=br7\nBONDING_OPTS="mode=4 use_carrier=0 miimon=100 updelay=100 lacp_rate=fast"\n',
    "br7": "TYPE=bridge\nPRIMARY=bond7\nBOOTPROTO=static\nIPADDR=10.30.0.1\nNETMASK=255.255.255.0\n"
           "IPV6INIT=static\nIPV6ADDR=2001:DB8:30:0::1\nIPV6PREFIXLENG=64\n",
    "row0": "BOOTPROTO=none\n",
    "row0.10": "VLAN_ROW_DEVICE=row0\nVLAN_ID=10\nBOOTPROTO=static\nIPADDR=10.10.0.1\nNETMASK=255.255.0.0\n",
}  # fmt: skip


def settled(name):
    """Whether an interface has its link, and the IPv6 address that comes with it."""
    [link] = ip("addr", "show", "dev", name)
    return link["operstate"] == "UP" and any(one["scope"] == "link" for one in link["addr_info"])


@pytest.fixture(autouse=True)
def machine():
    kept = {path: path.read_bytes() for path in SCRIPTS.glob("ifcfg-*")}
    kovainfo = KOVAINFO.read_bytes()
    network = NETWORK.read_bytes()
    for path in kept:
        path.unlink()
    run("ip", "-batch", "-", input=MADE)
    for name, text in FILES.items():
        interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\n{text}")
    wait_for(lambda: all(settled(name) for name in ("br7", "bond7", "row0.10", "eth0", "lan0", "lan1")), what="all links")
    kovanet("ipv6", "init")
    yield
    for name in ("br7", "bond7", "part0", "part1", "row0"):
        run("ip", "link", "del", name, status=None)
    for path in SCRIPTS.glob("ifcfg-*"):
        path.unlink()
    for path, text in kept.items():
        path.write_bytes(text)
    KOVAINFO.write_bytes(kovainfo)
    NETWORK.write_bytes(network)


# ---- show -----------------------------------------------------------------------------------------------------------


def test_show_has_parts_below_what_is_made_of_them():
    lines = kovanet("show").stdout.splitlines()
    assert [line.split(":")[0] for line in lines[:4]] == ["host name", "gateway", "DNS", "services"] and lines[4] == ""
    assert lines[5].split() == ["INTERFACE", "ROLE", "STATE", "LINK", "SPEED", "SOURCE", "ADDRESSES"]
    tree = [line for line in lines[6:] if not line.startswith(("eth", "lan"))]
    width = lines[5].index("ROLE")
    assert [line[:width].rstrip() for line in tree] == [
        "br7", "`-bond7", "  |-part0", "  `-part1", "row0.10", "`-row0"]
    assert tree[0].split()[1:] == ["bridge", "up", "up", *tree[0].split()[4:5], "static", "10.30.0.1/24",
                                   "2001:db8:30::1/64"]
    assert tree[1].split()[1:3] == ["bond", "802.3ad"]
    assert tree[4].split()[1:3] == ["vlan", "10"] and tree[4].split()[-1] == "10.10.0.1/16"


def widest_scope_first(address):
    scope = ["global", "site", "link", "host"].index(address["scope"])
    return address["family"] == "inet6", scope, ipaddress.ip_address(address["local"])


def test_show_as_json_has_every_interface_as_the_kernel_has_it():
    shown = data("show")
    assert list(shown) == documented("kovanet show")
    assert shown["hostname"] == os.uname().nodename.split(".")[0]
    rows = {row["name"]: row for row in shown["interfaces"]}
    assert all(list(row) == documented("kovanet show, each interface") for row in rows.values())
    links = {link["ifname"]: link for link in ip("addr", "show")}
    assert rows.keys() == links.keys()
    for name, row in rows.items():
        assert row["mtu"] == links[name]["mtu"] and row["mac"] == links[name]["address"]
        assert row["up"] == ("UP" in links[name]["flags"])
        assert [(one["address"], one["prefix"]) for one in row["addresses"]] == [
            (one["local"], one["prefixlen"]) for one in sorted(links[name]["addr_info"], key=widest_scope_first)]
    assert rows["br7"]["parts"] == ["bond7"] and sorted(rows["bond7"]["parts"]) == ["part0", "part1"]
    assert rows["row0.10"]["parts"] == ["row0"] and rows["row0.10"]["vlan_id"] == 10
    assert {name: rows[name]["kind"] for name in ("lo", "br7", "bond7", "row0.10", "row0", "eth0")} == {
        "lo": "loopback", "br7": "bridge", "bond7": "bond", "row0.10": "vlan", "row0": "card", "eth0": "card"}
    assert rows["bond7"]["bond_mode"] == "802.3ad" and rows["br7"]["bond_mode"] is None


def test_show_tells_what_else_there_is_when_a_part_cannot_be_read():
    NETWORK.unlink()
    NETWORK.mkdir()
    try:
        done = kovanet("show", status=CALL_FAILED)
    finally:
        NETWORK.rmdir()
        NETWORK.write_text("")
    assert "gateway:   cannot be read\n" in done.stdout and "row0.10" in done.stdout
    assert "cannot read the configured gateway" in done.stderr


UNREADABLE = {
    "/etc/kovainfo.conf": ("dns", "services"), "/etc/kova/service/kovatunnel.conf": ("services",),
    "/etc/dhcpd/dhcpd.info": ("services",), "/etc/dhcpd/dhcpd-pxe-setting": ("services",),
    "/etc/dhcpd/dhcpd-row0.info": ("services",),
}  # fmt: skip


@pytest.mark.parametrize("path", UNREADABLE)
def test_show_answers_nothing_for_a_file_that_cannot_be_read(path, keep):
    path = pathlib.Path(path)
    path.parent.mkdir(exist_ok=True)
    keep(path).unlink(missing_ok=True)
    path.mkdir()
    try:
        shown = data("show", status=CALL_FAILED)
        text = kovanet("show", status=CALL_FAILED).stdout
        if "dhcpd" in path.name:
            assert "dhcpd" in complaint("dhcp-server", "status", status=CALL_FAILED)
    finally:
        path.rmdir()
    assert {name for name, value in shown.items() if value is None} == set(UNREADABLE[str(path)])
    assert "cannot be read" in text


def test_show_leaves_open_where_one_address_comes_from_when_its_file_cannot_be_read():
    interface_file("row0").unlink()
    interface_file("row0").mkdir()
    try:
        rows = {row["name"]: row for row in data("show", status=CALL_FAILED)["interfaces"]}
    finally:
        interface_file("row0").rmdir()
    assert rows["row0"]["source"] is None and rows["br7"]["source"] == "static"


def test_show_takes_a_file_that_does_not_say_for_a_static_one():
    interface_file("row0").write_text("DEVICE=row0\nIPADDR=10.77.0.1\nNETMASK=255.255.255.0\n")
    assert {row["name"]: row["source"] for row in data("show")["interfaces"]}["row0"] == "static"


def test_show_keeps_what_is_on_another_namespaces_interface_apart():
    apart = ("ip", "netns", "exec", "apart")
    run("ip", "netns", "add", "apart")
    try:
        run("ip", "link", "add", "link", "row0", "name", "moved", "type", "vlan", "id", "20")
        run("ip", "link", "set", "moved", "netns", "apart", "name", "row0")
        run(*apart, "ip", "link", "add", "br0", "type", "bridge")
        run(*apart, "ip", "link", "set", "row0", "master", "br0")
        rows = {row["name"]: row for row in json.loads(run(*apart, "/usr/bin/kovanet", "show", "--json").stdout)["interfaces"]}
        lines = run(*apart, "/usr/bin/kovanet", "show").stdout.splitlines()
    finally:
        run("ip", "netns", "del", "apart")
    assert rows["row0"]["kind"] == "vlan" and rows["row0"]["parts"] == [] and rows["br0"]["parts"] == ["row0"]
    tree = [line.split()[0] for line in lines[6:]]
    assert tree == ["br0", "`-row0"]


def test_show_takes_no_words():
    assert "see kovanet show --help" in complaint("show", "eth0", status=USAGE)


# ---- verify ---------------------------------------------------------------------------------------------------------


def test_verify_agrees_where_the_kernel_is_as_the_files_say():
    found = data("verify")
    assert list(found) == documented("kovanet verify")
    assert found["agree"] is True and found["differences"] == [] and found["settings"] > 30
    assert kovanet("verify").stdout == f"the kernel agrees with the files in all {found['settings']} settings\n"


DEVIATIONS = {
    "up": ("link set br7 down", [("ifcfg-br7", "ONBOOT", "up", "down"),
                                 ("ifcfg-br7", "IPV6ADDR", "2001:DB8:30:0::1/64", "none")]),
    "address": ("addr del 10.10.0.1/16 dev row0.10", [("ifcfg-row0.10", "IPADDR", "10.10.0.1", "none"),
                                                      ("ifcfg-row0.10", "NETMASK", "255.255.0.0", "none")]),
    "IPv6 address": ("addr change 2001:db8:30::1/64 dev br7 preferred_lft forever\n"
                     "addr del 2001:db8:30::1/64 dev br7\naddr add 2001:db8:30::2/64 dev br7 nodad",
                     [("ifcfg-br7", "IPV6ADDR", "2001:DB8:30:0::1/64", "2001:db8:30::2/64")]),
    "member": ("link set part1 nomaster", [("ifcfg-part1", "MASTER", "bond7", "none"),
                                           ("ifcfg-part1", "SLAVE", "yes", "none"),
                                           ("ifcfg-part1", "ONBOOT", "up", "down")]),
    "port": ("link set bond7 nomaster", [("ifcfg-bond7", "BRIDGE", "br7", "none"),
                                         ("ifcfg-br7", "PRIMARY", "bond7", "none")]),
    "no bridge": ("link del br7\nlink add br7 type dummy\nlink set br7 up\naddr add 10.30.0.1/24 dev br7\n"
                  "addr add 2001:db8:30::1/64 dev br7 nodad",
                  [("ifcfg-br7", "TYPE", "bridge", "none"), ("ifcfg-br7", "PRIMARY", "bond7", "none"),
                   ("ifcfg-bond7", "BRIDGE", "br7", "none")]),
    "bond option": ("link set bond7 down\nlink set bond7 type bond updelay 300 lacp_rate slow\nlink set bond7 up",
                    [("ifcfg-bond7", "BONDING_OPTS", "updelay=100", "updelay=300"),
                     ("ifcfg-bond7", "BONDING_OPTS", "lacp_rate=fast", "lacp_rate=slow")]),
    "VLAN": ("link del row0.10", [("ifcfg-row0.10", "DEVICE", "row0.10", "none")]),
    "VLAN id": ("link del row0.10\nlink add link row0 name row0.10 type vlan id 11\nlink set row0.10 up\n"
                "addr add 10.10.0.1/16 dev row0.10", [("ifcfg-row0.10", "VLAN_ID", "10", "11")]),
    "own address": ("addr add 10.77.0.1/24 dev row0", [("ifcfg-row0", "BOOTPROTO", "none", "10.77.0.1")]),
}  # fmt: skip


@pytest.mark.parametrize("what", DEVIATIONS)
def test_verify_names_file_key_wanted_and_actual(what):
    batch, expected = DEVIATIONS[what]
    run("ip", "-batch", "-", input=batch + "\n")
    found = differences()
    assert all(one in found for one in expected), found
    assert {one[0] for one in found} == {one[0] for one in expected}


def test_verify_finds_files_that_want_something_else():
    interface_file("bond7").write_text(
        interface_file("bond7").read_text().replace("mode=4", "mode=1"))
    assert differences() == [("ifcfg-bond7", "BONDING_OPTS", "active-backup", "802.3ad")]
    with KOVAINFO.open("a") as file:
        file.write('row0_mtu="9000"\n')
    NETWORK.write_text("GATEWAY=10.30.0.254\n")
    assert differences()[1:] == [(str(KOVAINFO), "row0_mtu", "9000", str(link_of("row0")["mtu"])),
                                 (str(NETWORK), "GATEWAY", "10.30.0.254", "none")]
    assert [line.split()[1:] for line in kovanet("verify", status=NO).stdout.splitlines()] == [
        ["KEY", "WANTED", "ACTUAL"], ["BONDING_OPTS", "active-backup", "802.3ad"], ["row0_mtu", "9000", "1500"],
        ["GATEWAY", "10.30.0.254", "none"]]


def test_verify_knows_a_file_that_is_of_another_interface():
    interface_file("row0").write_text(interface_file("row0").read_text().replace("DEVICE=row0", "DEVICE=row1"))
    assert differences() == [("ifcfg-row0", "DEVICE", "row1", "row0")]


def test_verify_takes_a_file_without_a_protocol_as_static():
    text = interface_file("row0.10").read_text()
    interface_file("row0.10").write_text(text.replace("BOOTPROTO=static\n", ""))
    kovanet("verify", status=DONE)


def test_verify_leaves_out_copies_and_what_is_not_brought_up_at_boot():
    interface_file("ghost0").write_text("DEVICE=ghost0\nONBOOT=no\n")
    for copy in ("ghost0.saved", "ghost0.tmp1", "ghost0.bak", "ghost0~"):
        interface_file(copy).write_text("DEVICE=ghost0\nONBOOT=yes\n")
    assert kovanet("verify", status=DONE)
    interface_file("ghost0").write_text("DEVICE=ghost0\nONBOOT=yes\n")
    assert differences() == [("ifcfg-ghost0", "DEVICE", "ghost0", "none")]


def test_verify_of_a_file_that_cannot_be_read_fails():
    interface_file("row0").unlink()
    interface_file("row0").mkdir()
    try:
        assert complaint("verify", status=CALL_FAILED)
    finally:
        interface_file("row0").rmdir()
