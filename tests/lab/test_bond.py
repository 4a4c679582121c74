# box: --link eth0 --link lan0 --link lan1 --link lan2
# needs: bonding bridge dummy vlan
"""Bonds: made, changed and deleted by the library over links that run, with traffic while one of them is cut."""

import contextlib
import ctypes
import pathlib
import re

import pytest
from conftest import DhcpServer, addresses, is_up, on_other_side, run, wait_for, wait_for_partner
from sdk import STATIC, Bond, card, library, register

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
PLUGIN = pathlib.Path("/usr/kova/plugins/net/ifname_change/50-pull-out")
NETWORK_SCRIPT = pathlib.Path("/etc/rc.network")
LINKS = ("lan0", "lan1", "lan2")
UNKNOWN, ALB, LACP, XOR, BACKUP, ROUND_ROBIN, _, BALANCE_SLB = range(8)
# mode: the kernel's name and number, what is added to the options, and the partner that goes with it
KERNEL_MODES = {
    ALB: ("balance-alb 6", "", "bridge"),
    LACP: ("802.3ad 4", " lacp_rate=fast", "bond mode 4 lacp_rate fast"),
    XOR: ("balance-xor 2", "", "bond mode 2"),
    BACKUP: ("active-backup 1", "", "bridge"),
    ROUND_ROBIN: ("balance-rr 0", "", "bond mode 0"),
}
FILE = "DEVICE={0}\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.9{1}.5\nNETMASK=255.255.255.0\n"
BAD_PARAMETER = 0xD00


def path(link):
    return SCRIPTS / f"ifcfg-{link}"


@pytest.fixture(autouse=True)
def running_links(keep):
    """Three links with an address each, and no bond."""
    keep("/etc/kovainfo.conf")
    for number, link in enumerate(LINKS):
        path(link).write_text(FILE.format(link, number))
    run("/etc/rc.network", "start", *LINKS)
    yield
    bonds = [name for name in ("bond0", "bond0.20") if path(name).exists()]
    run("/etc/rc.network", "stop", *bonds, *LINKS)
    for file in SCRIPTS.glob("ifcfg-*"):
        if file.name != "ifcfg-eth0":
            file.unlink()
    assert run("ip", "-o", "link", "show", "type", "bond").stdout == ""


def bond(mode, members=("lan0", "lan1"), name="bond0"):
    wanted = Bond(szName=name.encode(), mode=mode, cSlaves=len(members))
    for place, member in zip(wanted.aszSlaves, members):
        place.value = member.encode()
    return wanted


def set_bond(wanted):
    return library.KOVANetLinkAggrSet(ctypes.byref(wanted))


def get_bond(name="bond0"):
    found = Bond()
    assert library.KOVANetLinkAggrGet(name.encode(), ctypes.byref(found)) == 0, register()
    return found


def of_kernel(attribute):
    return pathlib.Path(f"/sys/class/net/bond0/bonding/{attribute}").read_text().strip()


def member_states():
    """The link of each member as the bond sees it."""
    text = pathlib.Path("/proc/net/bonding/bond0").read_text()
    return dict(re.findall(r"Slave Interface: (\S+)\nMII Status: (\S+)\n", text))


def keys(link):
    return sorted(path(link).read_text().splitlines())


def wait_for_links(**wanted):
    wait_for(lambda: member_states() == wanted, what=f"the links {wanted}")


@pytest.mark.parametrize("mode", KERNEL_MODES)
def test_a_bond_carries_traffic_while_a_link_is_cut_and_gives_back_what_it_took(mode, partner):
    kernel_mode, more, kind = KERNEL_MODES[mode]
    partner(kind)
    files = {link: keys(link) for link in LINKS}

    assert set_bond(bond(mode)) == 0, register()
    assert (of_kernel("mode"), of_kernel("slaves")) == (kernel_mode, "lan0 lan1")
    assert (of_kernel("miimon"), of_kernel("updelay"), of_kernel("use_carrier")) == ("100", "100", "0")
    assert addresses("bond0") == ["192.168.90.5/24"]
    assert [addresses(link) for link in LINKS] == [[], [], ["192.168.92.5/24"]]
    options = f'BONDING_OPTS="mode={kernel_mode[-1]} use_carrier=0 miimon=100 updelay=100{more}"'
    assert keys("bond0") == sorted([*FILE.format("bond0", 0).splitlines(), "USERCTL=no", options])
    for link in ("lan0", "lan1"):
        assert keys(link) == sorted([*files[link], "MASTER=bond0", "SLAVE=yes", "USERCTL=no"])
    found = get_bond()
    assert (found.mode, found.members()) == (mode, ["lan0", "lan1"])
    wait_for_links(lan0="up", lan1="up")
    wait_for_partner()

    for cut, kept in (("lan0", "lan1"), ("lan1", "lan0")):
        on_other_side("ip", "link", "set", cut, "down")
        wait_for_links(**{cut: "down", kept: "up"})
        wait_for_partner()
        assert library.KOVANetIfIsLink(b"bond0") == 1
        on_other_side("ip", "link", "set", cut, "up")
        wait_for_links(lan0="up", lan1="up")

    assert set_bond(bond(UNKNOWN)) == 0, register()
    assert not pathlib.Path("/sys/class/net/bond0").exists() and not path("bond0").exists()
    assert {link: keys(link) for link in LINKS} == files
    assert [addresses(link) for link in LINKS] == [["192.168.90.5/24"], ["192.168.91.5/24"], ["192.168.92.5/24"]]
    assert all(is_up(link) for link in LINKS)


def test_an_aggregation_knows_whether_it_has_a_partner(partner):
    partner("bridge")
    assert set_bond(bond(LACP)) == 0, register()
    assert get_bond().blNoPartner == 1
    partner("bond mode 4 lacp_rate fast")
    wait_for(lambda: get_bond().blNoPartner == 0, what="the partner")
    mac = on_other_side("cat", "/sys/class/net/uplink/address").stdout.strip()
    assert of_kernel("ad_partner_mac") == mac
    wait_for_partner()


def test_a_bond_changes_mode_and_members_and_keeps_its_vlan(partner):
    partner("bridge", LINKS)
    assert set_bond(bond(BACKUP, LINKS)) == 0, register()
    static = card(STATIC, "bond0", "192.168.90.5", "255.255.255.0")
    assert library.KLIBNetVlanCreate(b"bond0", 20, ctypes.byref(static)) == 0, register()
    assert (addresses("bond0"), addresses("bond0.20")) == ([], ["192.168.90.5/24"])

    partner("bond mode 4 lacp_rate fast", LINKS)
    on_other_side("ip", "-batch", "-", input="link add link uplink name uplink.20 type vlan id 20\naddr flush dev uplink\n"
                                             "link set uplink.20 up\naddr add 192.168.90.1/24 dev uplink.20\n")  # fmt: skip
    assert set_bond(bond(LACP, LINKS)) == 0, register()
    assert (of_kernel("mode"), of_kernel("slaves")) == ("802.3ad 4", "lan0 lan1 lan2")
    assert addresses("bond0.20") == ["192.168.90.5/24"]
    wait_for_partner()
    index = run("cat", "/sys/class/net/bond0/ifindex").stdout
    wait_for(lambda: get_bond().blNoPartner == 0, what="the partner")
    assert set_bond(get_bond()) == 0
    assert run("cat", "/sys/class/net/bond0/ifindex").stdout == index, "made anew although nothing changed"

    assert set_bond(bond(LACP, ("lan0", "lan1"))) == 0, register()
    assert of_kernel("slaves") == "lan0 lan1"
    assert "MASTER" not in path("lan2").read_text()
    assert is_up("lan2"), "left behind"
    wait_for_partner()


def test_a_vlan_above_a_bond_gives_its_address_back(partner):
    partner("bridge", LINKS)
    assert set_bond(bond(BACKUP, LINKS)) == 0, register()
    before = keys("bond0")
    static = card(STATIC, "bond0", "192.168.90.5", "255.255.255.0")
    assert library.KLIBNetVlanCreate(b"bond0", 20, ctypes.byref(static)) == 0, register()
    assert library.KLIBNetVlanRemove(b"bond0.20") == 0, register()
    assert keys("bond0") == before and not path("bond0.20").exists()
    assert (of_kernel("mode"), of_kernel("slaves")) == ("active-backup 1", "lan0 lan1 lan2")
    assert addresses("bond0") == ["192.168.90.5/24"]
    wait_for_partner()


def test_a_bond_takes_over_the_lease_of_its_first_member(partner, tmp_path):
    partner("bridge")
    with DhcpServer("uplink", "192.168.60", folder=tmp_path):
        path("lan0").write_text("DEVICE=lan0\nONBOOT=yes\nBOOTPROTO=dhcp\n")
        run("/etc/rc.network", "start", "lan0")
        leased = wait_for(lambda: [one for one in addresses("lan0") if one.startswith("192.168.60.")], what="a lease")
        assert set_bond(bond(BACKUP)) == 0, register()
        assert wait_for(lambda: addresses("bond0"), what="the bond's lease") == leased
        assert addresses("lan0") == []
        assert set_bond(bond(UNKNOWN)) == 0, register()
        assert wait_for(lambda: addresses("lan0"), what="the member's lease") == leased
        run("/etc/rc.network", "stop", "lan0")


def test_a_bond_that_cannot_be_deleted_runs_on(partner):
    partner("bridge")
    assert set_bond(bond(BACKUP)) == 0, register()
    files = {link: keys(link) for link in ("bond0", "lan0")}
    kept = path("lan1").rename(SCRIPTS.parent / "kept")
    path("lan1").mkdir()
    try:
        assert set_bond(bond(UNKNOWN)) == -1
    finally:
        path("lan1").rmdir()
        kept.rename(path("lan1"))
    assert {link: keys(link) for link in files} == files
    assert of_kernel("slaves") == "lan0", "without the file of the other"
    assert addresses("bond0") == ["192.168.90.5/24"]
    wait_for_partner()
    run("/etc/rc.network", "restart", "bond0")
    assert of_kernel("slaves") == "lan0 lan1"


def plug_in_spare():
    run("ip", "link", "add", "spare0", "type", "dummy")


@pytest.fixture
def spare():
    """A card that can be pulled out."""
    path("spare0").write_text(FILE.format("spare0", 3))
    plug_in_spare()
    yield
    run("ip", "link", "del", "spare0", status=None)


@contextlib.contextmanager
def pulled_out_by(script, when):
    """Meanwhile a script begins with pulling out the spare card, where a condition of the shell holds."""
    before = script.read_text() if script.exists() else None
    script.parent.mkdir(parents=True, exist_ok=True)
    script.write_text(f"#!/bin/sh\nif {when}; then /sbin/ip link del spare0; fi\n{before or ''}")
    script.chmod(0o755)
    try:
        yield
    finally:
        if before is None:
            script.unlink()
        else:
            script.write_text(before)


def all_files():
    names = [file.name.removeprefix("ifcfg-") for file in SCRIPTS.glob("ifcfg-*")]
    return {name: keys(name) for name in names}


def test_a_member_that_vanishes_midway(spare, system_log):
    """Nothing is given up for it: the other member works, and it belongs again once it is back."""

    def set_and_lose(wanted):
        system_log.messages.clear()
        assert set_bond(wanted) == 0, register()
        assert not pathlib.Path("/sys/class/net/spare0").exists()
        wait_for(lambda: system_log.holds("spare0: there is no such interface"), 30, "the complaint")

    before, members = all_files(), ("lan0", "spare0")
    joined = {link: sorted([*before[link], "MASTER=bond0", "SLAVE=yes", "USERCTL=no"]) for link in members}
    before_change, at_start = '[ "$PLUGIN_PHASE" = PRE ]', '[ "$1" = start ]'  # a change raises no event
    for mode, script, when in (BACKUP, PLUGIN, before_change), (XOR, NETWORK_SCRIPT, at_start):
        with pulled_out_by(script, when):
            set_and_lose(bond(mode, members))
        kernel_mode, more, _ = KERNEL_MODES[mode]
        options = f'BONDING_OPTS="mode={kernel_mode[-1]} use_carrier=0 miimon=100 updelay=100{more}"'
        bonded = sorted([*FILE.format("bond0", 0).splitlines(), "USERCTL=no", options])
        assert all_files() == {**before, **joined, "bond0": bonded}
        assert (of_kernel("mode"), of_kernel("slaves")) == (kernel_mode, "lan0")
        assert addresses("bond0") == ["192.168.90.5/24"]
        plug_in_spare()
        run(NETWORK_SCRIPT, "restart", "bond0")
        assert (of_kernel("slaves"), addresses("bond0")) == ("lan0 spare0", ["192.168.90.5/24"])

    with pulled_out_by(PLUGIN, before_change):
        set_and_lose(bond(UNKNOWN))
    assert all_files() == {**before, "lan0.saved": bonded, "spare0.saved": joined["spare0"]}
    assert not pathlib.Path("/sys/class/net/bond0").exists()
    assert addresses("lan0") == ["192.168.90.5/24"]
    plug_in_spare()
    run(NETWORK_SCRIPT, "start", "spare0")
    assert addresses("spare0") == ["192.168.93.5/24"]


@pytest.fixture
def switch_bond():
    """What the virtual switch leaves of a bond of lan0 and lan1: a device by its name, and the file."""
    run("ip", "link", "add", "ovs_bond0", "type", "bridge")
    path("ovs_bond0").write_text('DEVICE=ovs_bond0\nSLAVE_LIST="lan1 lan0 gone0"\nBOND_MODE="balance-slb"\n')
    yield b"ovs_bond0"
    run("ip", "link", "del", "ovs_bond0")
    path("ovs_bond0").unlink()


def test_a_bond_of_the_switch_is_what_its_file_says_of_links_that_are_there(switch_bond):
    mtus = {link: pathlib.Path(f"/sys/class/net/{link}/mtu") for link in ("lan0", "lan1")}
    found = get_bond("ovs_bond0")
    assert (found.mode, found.members(), found.blNoPartner) == (BALANCE_SLB, ["lan0", "lan1"], 0)

    assert library.KOVANetSetMTUEth(b"1400", switch_bond) == 0, register()
    assert [mtu.read_text() for mtu in mtus.values()] == ["1400\n", "1400\n"]
    mtus["lan1"].write_text("1500")
    assert library.KOVAGetMTUSetting(switch_bond) == 1500
    mtus["lan0"].write_text("1500")

    wait_for(lambda: library.KOVANetIfIsLink(switch_bond) == 1, what="a link")
    for link in ("lan0", "lan1"):
        assert library.KOVANetIfIsLink(switch_bond) == 1
        on_other_side("ip", "link", "set", link, "down")
        wait_for(lambda: library.KOVANetIfIsLink(link.encode()) == 0, what=f"{link} to lose its link")
    assert library.KOVANetIfIsLink(switch_bond) == 0
    for link in ("lan0", "lan1"):
        on_other_side("ip", "link", "set", link, "up")

    path("ovs_bond0").write_text('SLAVE_LIST="lan0 lan1"\n')
    assert library.KOVANetLinkAggrGet(switch_bond, ctypes.byref(Bond())) == 1, "a bond, but which"


@pytest.mark.parametrize("members", [(), ("lan0",), ("lan0", "")])
def test_too_few_members_are_refused_and_run_on(members):
    files = {link: keys(link) for link in LINKS}
    assert set_bond(bond(BACKUP, members)) == -1
    assert register()[0] == BAD_PARAMETER
    assert not path("bond0").exists() and not pathlib.Path("/sys/class/net/bond0").exists()
    assert {link: keys(link) for link in LINKS} == files
    assert [addresses(link) for link in LINKS] == [["192.168.90.5/24"], ["192.168.91.5/24"], ["192.168.92.5/24"]]
