# box: --ovs-bonds tests/lab/switch_bonds --link eth0 --link lan0 --link lan1
# needs: bonding dummy openvswitch
"""The virtual switch's own devices: a port over eth0 and a bond of lan0 and lan1, read and worked on by library, tool and
network script, and compared with what the switch and iproute2 say. The switch keeps all that it has through every test."""

import ctypes
import pathlib

import pytest
from conftest import (
    CALL_FAILED, NO, Daemon, addresses, asked, complaint, data, is_up, keys_of, kovanet, on_other_side, run,
    wait_for, wait_for_partner,
)  # fmt: skip
from dhcp_lab import FILES, clean_server, serve, served_lines, udhcpc
from sdk import STATIC, Bond, EthInfo, card, interfaces, library, register, set_card
from test_kovanet import interface_file, ip, link_of

PROGRAMS = pathlib.Path(__file__).resolve().parents[2] / "build" / "openvswitch"
RUN = pathlib.Path("/run/openvswitch")
KOVAINFO = pathlib.Path("/etc/kovainfo.conf")
PORT, BOND = 1, 2
PHYSICAL, LOGICAL, LOGICAL_AND_BELOW = 1, 2, 8
MEMBERS = ["lan0", "lan1"]
# the library's mode: its name in the file, the switch's own settings, and the partner that goes with it
MODES = {
    6: ("ovs-active-backup", ["bond_mode=active-backup", "lacp=off"], "bridge"),
    7: ("balance-slb", ["bond_mode=balance-slb", "lacp=off"], "bridge"),
    8: ("balance-tcp", ["bond_mode=balance-tcp", "lacp=active"], "bond mode 4 lacp_rate fast"),
}
STATIC_FILE = "BOOTPROTO=static\nIPADDR={}\nNETMASK=255.255.255.0\n"
BOND_FILE = 'SLAVE_LIST="lan1 lan0 gone0"\nBOND_MODE="{}"\n' + STATIC_FILE.format("192.168.90.5")


def vsctl(*words):
    return run(PROGRAMS / "ovs-vsctl", f"--db=unix:{RUN}/db.sock", "--timeout=60", *words).stdout.strip()


def member_states():
    """The links of the bond as the switch sees them."""
    shown = run(PROGRAMS / "ovs-appctl", "-t", RUN / "switch.ctl", "bond/show", "bond0").stdout
    lines = [line.removeprefix("member ").split(": ") for line in shown.splitlines() if line.startswith("member ")]
    return dict(lines)


def wait_for_members(**wanted):
    wait_for(lambda: member_states() == wanted, 30, f"the members {wanted}")


def of_switch():
    """What the switch is made of, and what the kernel has of it."""
    links = {link["ifname"]: link for link in ip("-d", "link", "show")}
    kinds = {name: (link.get("linkinfo", {}).get("info_kind"), link.get("master")) for name, link in links.items()}
    return vsctl("show"), kinds


def ip_names():
    return sorted(link["ifname"] for link in ip("link", "show"))


def write(name, text):
    interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\n{text}")


@pytest.fixture(scope="module", autouse=True)
def switch():
    """The switch, with a bridge for eth0 and one for the bond; nothing of it stays."""
    if not PROGRAMS.exists():
        pytest.skip("lab/prepare found no package with a virtual switch, and says why")
    # it takes the processors to be none, and handles no packets, until the machine has run for 10 s
    wait_for(lambda: float(pathlib.Path("/proc/uptime").read_text().split()[0]) > 11, 20, "the time to start the switch")
    RUN.mkdir()
    run(PROGRAMS / "ovsdb-tool", "create", RUN / "conf.db", PROGRAMS / "vswitch.ovsschema")
    database = [PROGRAMS / "ovsdb-server", RUN / "conf.db", f"--remote=punix:{RUN}/db.sock", f"--unixctl={RUN}/db.ctl"]
    daemon = [PROGRAMS / "ovs-vswitchd", f"unix:{RUN}/db.sock", f"--unixctl={RUN}/switch.ctl", "--verbose=console:warn"]
    with Daemon(database, (RUN / "db.sock").exists):
        vsctl("--no-wait", "init")
        with Daemon(daemon, (RUN / "switch.ctl").exists):
            vsctl("add-br", "ovs_eth0", "--", "add-port", "ovs_eth0", "eth0")
            vsctl("add-br", "ovs_bond0", "--", "add-bond", "ovs_bond0", "bond0", *MEMBERS, *MODES[6][1],
                  "other_config:lacp-time=fast")  # fmt: skip
            yield
            vsctl("del-br", "ovs_eth0", "--", "del-br", "ovs_bond0")
            wait_for(lambda: not run("ip", "-o", "link", "show", "type", "openvswitch").stdout, what="the devices' end")


def write_files():
    for name in ("eth0", *MEMBERS):
        write(name, "BOOTPROTO=none\n")
    write("ovs_eth0", STATIC_FILE.format("192.168.50.10"))
    write("ovs_bond0", BOND_FILE.format(MODES[6][0]))


@pytest.fixture(scope="module", autouse=True)
def started(switch):
    """Everything up by its file."""
    write_files()
    run("/etc/rc.network", "start")


@pytest.fixture(autouse=True)
def kept_switch(started, keep):
    """The files are there, eth0 leads to 192.168.50.1, and the switch is in the end what it was."""
    keep(KOVAINFO)
    write_files()
    on_other_side("ip", "addr", "replace", "192.168.50.1/24", "dev", "eth0")
    wait_for_members(lan0="enabled", lan1="enabled")
    before = of_switch()
    yield
    assert of_switch() == before


@pytest.fixture
def started_again():
    """For what changes addresses."""
    yield
    write_files()
    run("/etc/rc.network", "start", "ovs_eth0", "ovs_bond0")


@pytest.fixture
def bond_in():
    """bond_in(mode): the switch's bond in another mode, until the test ends."""

    def work(mode):
        vsctl("set", "port", "bond0", *MODES[mode][1])

    yield work
    work(6)


def test_the_devices_are_told_apart():
    roles = {name: library.KLIBNetOVSIfIsMaster(name.encode()) for name in ip_names()}
    assert roles == {**dict.fromkeys(roles, 0), "ovs_eth0": PORT, "ovs_bond0": BOND}
    assert sorted(name for name, role in roles.items() if role) == sorted(vsctl("list-br").split())
    assert library.KLIBNetOVSIfIsMaster(b"ovs_gone0") == 0

    original = ctypes.create_string_buffer(16)
    assert library.KLIBNetOVSGetOriginalIf(b"ovs_eth0", original, len(original)) == 0
    assert vsctl("list-ports", "ovs_eth0") == original.value.decode() == "eth0"

    assert sorted(vsctl("list-ifaces", "ovs_bond0").split()) == MEMBERS
    for question in (library.KLIBNetOVSIfIsSlave, library.KOVANetIfIsBondingPassive):
        assert [name for name in ip_names() if question(name.encode())] == MEMBERS
    assert not any(library.KLIBNetBridgeIfIsSlave(name.encode()) for name in ip_names()), "a switch is no kernel's bridge"


@pytest.mark.parametrize("kind", [PHYSICAL, LOGICAL, LOGICAL_AND_BELOW])
def test_enumerations_hold_ports_and_bonds_and_no_members(kind):
    links = {link["ifname"]: link for link in ip("addr", "show")}
    found = interfaces(kind)
    assert found.keys() == {"eth0", "ovs_eth0", "ovs_bond0"}
    for name, record in found.items():
        assert ":".join(f"{byte:02x}" for byte in record.abMac) == links[name]["address"]
        assert record.nLink == 2 and "LOWER_UP" in links[name]["flags"]
        shown = [one["local"] for one in links[name]["addr_info"] if one["family"] == "inet"] or [""]
        assert [record.szIP.decode()] == shown
        assert library.KOVANetIsDevTypeMatch(name.encode(), kind) == 1
    assert library.KOVANetIsDevTypeMatch(b"lan0", kind) == 0


def test_a_port_has_the_ethernet_link_of_the_interface_behind_it():
    told = {}
    for name in (b"eth0", b"ovs_eth0"):
        told[name] = EthInfo()
        assert library.KOVANetGetEthInfo(ctypes.byref(told[name]), name) == 0, register()
    assert bytes(told[b"ovs_eth0"]) == bytes(told[b"eth0"])
    assert told[b"eth0"].nSpeed == int(pathlib.Path("/sys/class/net/eth0/speed").read_text())
    assert told[b"eth0"].nMTU == link_of("eth0")["mtu"]
    of_bond = EthInfo()
    assert library.KOVANetGetEthInfo(ctypes.byref(of_bond), b"ovs_bond0") == 0, register()
    assert (of_bond.nSpeed, of_bond.nDuplex, of_bond.nMTU) == (-1, told[b"eth0"].nDuplex, link_of("lan0")["mtu"])


def test_the_link_of_a_port_is_that_of_the_interface_behind_it():
    assert library.KOVANetIfIsLink(b"ovs_eth0") == 1
    on_other_side("ip", "link", "set", "eth0", "down")
    try:
        wait_for(lambda: library.KOVANetIfIsLink(b"ovs_eth0") == 0, 30, "the end of the link")
        assert "LOWER_UP" in link_of("ovs_eth0")["flags"], "the switch's device runs on"
        wait_for(lambda: vsctl("get", "interface", "eth0", "link_state") == "down", 30, "the switch to see it")
        assert interfaces(LOGICAL)["ovs_eth0"].nLink == 0
        assert [data("link", "show", name)[0]["link"] for name in ("eth0", "ovs_eth0")] == ["down", "down"]
    finally:
        on_other_side("ip", "link", "set", "eth0", "up")
    wait_for(lambda: library.KOVANetIfIsLink(b"ovs_eth0") == 1, 30, "the link")
    wait_for_partner("192.168.50.1")


def received(link):
    return int(pathlib.Path(f"/sys/class/net/{link}/statistics/rx_packets").read_text())


@pytest.mark.parametrize("mode", MODES)
def test_a_bond_is_read_and_carries_traffic_while_a_link_is_cut(mode, partner, bond_in):
    name, _, kind = MODES[mode]
    partner(kind)
    bond_in(mode)
    write("ovs_bond0", BOND_FILE.format(name))
    found = Bond()
    assert library.KOVANetLinkAggrGet(b"ovs_bond0", ctypes.byref(found)) == 0, register()
    assert (found.mode, found.members(), found.blNoPartner) == (mode, MEMBERS, 0)
    assert name.removeprefix("ovs-") == vsctl("get", "port", "bond0", "bond_mode")
    row = data("bond", "show", "ovs_bond0")
    assert (row["name"], row["mode"], row["members"], row["partner"]) == ("ovs_bond0", name, MEMBERS, None)
    assert (row["up"], row["link"], row["address"], row["prefix"]) == (True, "up", "192.168.90.5", 24)
    assert data("bond", "list") == [row]

    wait_for_members(lan0="enabled", lan1="enabled")
    wait_for_partner()
    for cut, kept in (("lan0", "lan1"), ("lan1", "lan0")):
        on_other_side("ip", "link", "set", cut, "down")
        wait_for_members(**{cut: "disabled", kept: "enabled"})
        before = received(kept)
        wait_for_partner()
        assert received(kept) > before
        assert [library.KOVANetIfIsLink(link.encode()) for link in (cut, kept, "ovs_bond0")] == [0, 1, 1]
        on_other_side("ip", "link", "set", cut, "up")
        wait_for_members(lan0="enabled", lan1="enabled")
    wait_for_partner()


def test_a_bond_without_a_link_has_none():
    for link in MEMBERS:
        on_other_side("ip", "link", "set", link, "down")
    wait_for_members(lan0="disabled", lan1="disabled")
    assert library.KOVANetIfIsLink(b"ovs_bond0") == 0
    assert interfaces(LOGICAL)["ovs_bond0"].nLink == 0
    assert data("bond", "show", "ovs_bond0")["link"] == "down"
    for link in MEMBERS:
        on_other_side("ip", "link", "set", link, "up")


def test_show_has_what_is_behind_ports_and_bonds_below_them():
    rows = {row["name"]: row for row in data("show")["interfaces"]}
    assert (rows["ovs_eth0"]["kind"], rows["ovs_eth0"]["parts"]) == ("switch-port", ["eth0"])
    assert (rows["ovs_bond0"]["kind"], rows["ovs_bond0"]["parts"], rows["ovs_bond0"]["bond_mode"]) == (
        "bond", MEMBERS, "ovs-active-backup")  # fmt: skip
    lines = kovanet("show").stdout.splitlines()
    [header] = [line for line in lines if line.startswith("INTERFACE")]
    tree = [line[: header.index("ROLE")].rstrip() for line in lines[lines.index(header) + 1 :]]
    assert tree == ["ovs-system", "ovs_bond0", "|-lan0", "`-lan1", "ovs_eth0", "`-eth0"]
    links = {link["ifname"]: link for link in ip("addr", "show")}
    for row in data("link", "show"):
        assert (row["mac"], row["up"]) == (links[row["name"]]["address"], "UP" in links[row["name"]]["flags"])


def test_verify_agrees_with_a_switch_that_is_as_the_files_say(started_again):
    assert data("verify")["differences"] == []
    run("ip", "addr", "flush", "dev", "ovs_bond0")
    assert [(row["key"], row["wanted"]) for row in data("verify", status=NO)["differences"]] == [
        ("IPADDR", "192.168.90.5"), ("NETMASK", "255.255.255.0")]  # fmt: skip


def test_a_card_of_the_switch_gets_an_address(started_again):
    for name, address, other in (("ovs_eth0", "192.168.50.20", "192.168.50.1"), ("ovs_bond0", "192.168.90.20", None)):
        assert set_card(card(STATIC, name, address, "255.255.255.0")) == 0, register()
        assert addresses(name) == [f"{address}/24"]
        kept = keys_of(interface_file(name))
        assert (kept["BOOTPROTO"], kept["IPADDR"]) == ("static", address)
        assert ("SLAVE_LIST" in kept) == (name == "ovs_bond0")
        if other:
            wait_for_partner(other)


@pytest.mark.parametrize(
    ("words", "message"),
    [
        ("change ovs_bond0 802.3ad lan0 lan1", "ovs_bond0 is a bond of the virtual switch, which is not changed here"),
        ("delete ovs_bond0", "ovs_bond0 is a bond of the virtual switch, which is not changed here"),
        ("create ovs_bond1 802.3ad lan0 lan1", 'bond name "ovs_bond1" is not valid: names that begin with ovs_ are the '
                                               "virtual switch's"),
        ("create bond1 balance-slb lan0 lan1", 'mode "balance-slb" is one of the virtual switch, whose bonds are not made '
                                               "here"),
    ],
)  # fmt: skip
def test_a_bond_of_the_switch_is_not_made_or_changed(words, message):
    before = keys_of(interface_file("ovs_bond0"))
    assert complaint("bond", *words.split(), "--yes", status=NO) == message
    assert keys_of(interface_file("ovs_bond0")) == before


# ---- MTU


def mtu(link):
    return link_of(link)["mtu"]


def stored():
    return {key: value.strip('"') for key, value in keys_of(KOVAINFO).items() if key.endswith("_mtu")}


@pytest.fixture
def usual_mtu():
    yield
    for side in ([], ["-n", "net"]):
        for link in ("eth0", *MEMBERS):
            run("ip", *side, "link", "set", link, "mtu", "1500")
    for link in ("ovs_eth0", "ovs_bond0"):
        wait_for(lambda: mtu(link) == 1500, 30, f"the MTU of {link}")


def test_the_mtu_of_a_bond_is_its_members(partner, usual_mtu):
    partner("bridge")
    on_other_side("ip", "-batch", "-", input="".join(f"link set {link} mtu 9000\n" for link in (*MEMBERS, "uplink")))
    status, said = asked("mtu", "set", "ovs_bond0", "9000", answer=b"y\n")
    assert status == 0 and said.startswith("lan0 and lan1 get the MTU 9000 and go down for a moment.\n")
    assert [mtu(link) for link in MEMBERS] == [9000, 9000]
    assert stored() == {"ovs_bond0_mtu": "9000", "lan0_mtu": "9000", "lan1_mtu": "9000"}
    assert data("mtu", "show", "ovs_bond0") == [{"name": "ovs_bond0", "mtu": 9000, "configured_mtu": 9000}]
    wait_for(lambda: mtu("ovs_bond0") == 9000, 30, "the switch's own device to follow")
    wait_for_members(lan0="enabled", lan1="enabled")
    wait_for_partner()
    run("ping", "-c", "1", "-W", "30", "-M", "do", "-s", "8972", "192.168.90.1")
    assert data("verify")["differences"] == []


def test_the_mtu_of_a_port_is_that_of_the_interface_behind_it(usual_mtu):
    status, said = asked("mtu", "set", "ovs_eth0", "1400", answer=b"y\n")
    assert status == 0 and said.startswith("eth0 gets the MTU 1400 and goes down for a moment.\n")
    assert mtu("eth0") == 1400 and stored() == {"eth0_mtu": "1400"}
    assert data("mtu", "show", "ovs_eth0") == [{"name": "ovs_eth0", "mtu": 1400, "configured_mtu": 1400}]
    wait_for(lambda: mtu("ovs_eth0") == 1400, 30, "the switch's own device to follow")
    assert addresses("ovs_eth0") == ["192.168.50.10/24"]
    wait_for_partner("192.168.50.1")


@pytest.fixture
def obstinate_member():
    """The bond gets a third member, which takes no MTU above 1500."""
    run("ip", "-batch", "-", input="link add low0 type dummy\nlink add link low0 name twin0 type macvlan\nlink set low0 up\n"
                                   "link set twin0 up\n")  # fmt: skip
    vsctl("--", "--id=@new", "create", "interface", "name=twin0", "--", "add", "port", "bond0", "interfaces", "@new")
    write("ovs_bond0", BOND_FILE.format("ovs-active-backup").replace("gone0", "twin0"))
    yield "twin0"
    vsctl("remove", "port", "bond0", "interfaces", vsctl("get", "interface", "twin0", "_uuid"))
    run("ip", "link", "del", "low0")


def test_an_mtu_that_one_member_refuses_is_kept_by_none(obstinate_member, usual_mtu):
    for before in ("", 'lan0_mtu="1480"\novs_bond0_mtu="1480"\n'):
        KOVAINFO.write_text(before)
        text = complaint("mtu", "set", "ovs_bond0", "9000", "--yes", status=CALL_FAILED)
        assert text.startswith("cannot set the MTU of ovs_bond0 to 9000: NET_ERR_SYSCALL (0x8100) in net_set_mtu_eth")
        assert KOVAINFO.read_text() == before
        assert [mtu(link) for link in (*MEMBERS, obstinate_member)] == [1500, 1500, 1500]
        assert all(is_up(link) for link in (*MEMBERS, obstinate_member))
        assert data("mtu", "show", "ovs_bond0")[0]["mtu"] == 1500


# ---- files


def test_the_network_script_leaves_the_switch_as_it_is(partner):
    partner("bridge")
    before = of_switch()
    run("/etc/rc.network", "stop")
    assert not any(is_up(name) for name in ("eth0", *MEMBERS, "ovs_eth0", "ovs_bond0"))
    assert of_switch() == before
    for words in (["start"], ["restart", "eth0", "lan0"], ["restart", "ovs_eth0", "ovs_bond0"]):
        run("/etc/rc.network", *words)
        assert of_switch() == before
        assert (addresses("ovs_eth0"), addresses("ovs_bond0")) == (["192.168.50.10/24"], ["192.168.90.5/24"])
        assert [addresses(name) for name in ("eth0", *MEMBERS)] == [[], [], []]
        wait_for_partner("192.168.50.1")
        wait_for_partner()


def test_the_dhcp_server_goes_along_to_the_port_and_back(tmp_path, started_again):
    on_other_side("ip", "-4", "addr", "flush", "dev", "eth0")
    run("ip", "-4", "addr", "flush", "dev", "ovs_eth0")
    with clean_server("eth0"):
        serve("eth0", "192.168.60")
        run("ip", "-4", "addr", "flush", "dev", "eth0")
        run("ip", "addr", "replace", "192.168.60.1/24", "dev", "ovs_eth0")
        assert library.DHCPDConfChangeInterface(b"eth0", b"ovs_eth0") == 0, register()
        assert library.DHCPServerRestart() == 0, register()
        assert "interface=ovs_eth0" in served_lines()
        assert udhcpc("eth0", tmp_path)["router"] == "192.168.60.1"
        assert library.DHCPDConfChangeInterface(b"ovs_eth0", b"eth0") == 0, register()
        assert not list(FILES.glob("*ovs_eth0*")) and list(FILES.glob("dhcpd-eth0-subnet0.*"))
