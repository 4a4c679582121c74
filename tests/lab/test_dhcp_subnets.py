# box: --link eth0 --link kx12
"""Which clients are served when subnets and interfaces are switched, renamed, and handed to a bond and back."""

import concurrent.futures
import contextlib

import pytest
from conftest import run, wait_for
from dhcp_lab import (
    FILES, V4, V6, KeptLease, bring_up, clean_server, fix_lease, serve, served_lines, switch, udhcpc, v4_subnet, write,
)  # fmt: skip
from sdk import dhcp_subnet, library, string_list


@pytest.fixture(autouse=True)
def server():
    with clean_server("eth0", "kx12"):
        yield


def restart():
    assert library.KLIBNetDHCPServerRestart() == 0


def told_at_once(folder, **calls):
    """What several clients are told that ask side by side: link="served" or, for a few tries, link="silent"."""
    with concurrent.futures.ThreadPoolExecutor() as pool:
        asked = {link: pool.submit(udhcpc, link, folder, tries=20 if expected == "served" else 3)
                 for link, expected in calls.items()}  # fmt: skip
        told = {link: "served" if future.result() else "silent" for link, future in asked.items()}
    assert told == calls


def test_subnet_without_name_servers_keeps_itself_and_the_others_served(tmp_path, system_log):
    serve("eth0", "192.168.60", dns1="", dns2="")
    serve("kx12", "192.168.61")
    fragment = FILES / "dhcpd-eth0-subnet0.conf"
    before = fragment.read_text()
    refused = "dhcp-option=tag:eth00,option:dns-server,"
    assert refused in before.splitlines()
    restart()
    wait_for(lambda: system_log.holds(f'dhcpd-eth0-subnet0.conf: left out "{refused}": '))
    for line in before.splitlines():
        assert (line in served_lines()) == (line != refused)
    assert fragment.read_text() == before
    without, other = udhcpc("eth0", tmp_path), udhcpc("kx12", tmp_path)
    assert (without["router"], without["domain"]) == ("192.168.60.1", "lab.example")
    assert "dns" not in without
    assert (other["router"], other["dns"]) == ("192.168.61.1", "192.168.61.53 192.168.61.54")


def test_second_subnet_of_an_interface_has_its_own_options(tmp_path):
    serve("eth0", "192.168.60", first=10, last=10, options=[(26, "mtu", "1400")])
    bring_up("eth0", "192.168.62.1/24")
    write("eth0", v4_subnet("192.168.62", first=20, last=20, options=[(26, "mtu", "1300")]), number=1)
    restart()
    told = [udhcpc("eth0", tmp_path, who=who, requests=[26]) for who in (1, 2)]
    assert {lease["ip"]: (lease["router"], lease["dns"], lease["mtu"]) for lease in told} == {
        "192.168.60.10": ("192.168.60.1", "192.168.60.53 192.168.60.54", "1400"),
        "192.168.62.20": ("192.168.62.1", "192.168.62.53 192.168.62.54", "1300"),
    }


def test_subnet_that_is_switched_off_gives_no_address(tmp_path):
    serve("eth0", "192.168.60", first=10, last=10)
    bring_up("eth0", "192.168.62.1/24")
    write("eth0", v4_subnet("192.168.62"), number=1)
    assert library.DHCPTagConfSetEnable(b"eth0", 0, V4, 0) == 0
    restart()
    assert udhcpc("eth0", tmp_path)["router"] == "192.168.62.1"
    assert library.DHCPTagConfSetEnable(b"eth0", 0, V4, 1) == 0
    assert library.DHCPTagConfSetEnable(b"eth0", 1, V4, 0) == 0
    restart()
    assert udhcpc("eth0", tmp_path)["ip"] == "192.168.60.10"


def test_interface_that_is_switched_off_is_not_served(tmp_path):
    for link, network in {"eth0": "192.168.60", "kx12": "192.168.61"}.items():
        serve(link, network)
        fix_lease(link, link, f"{network}.99")
    assert library.DHCPInterfaceSetEnabled(b"kx12", V4, 0) == 0
    restart()
    told_at_once(tmp_path, eth0="served", kx12="silent")
    assert library.DHCPInterfaceSetEnabled(b"kx12", V4, 1) == 0
    restart()
    assert udhcpc("kx12", tmp_path)["router"] == "192.168.61.1"


@contextlib.contextmanager
def renamed(old, new):
    """The kernel's interface by another name, down while it changes."""

    def rename(before, after):
        run("ip", "link", "set", before, "down")
        assert library.KOVANetRenameEth(before.encode(), after.encode()) == 0
        run("ip", "link", "set", after, "up")

    rename(old, new)
    yield
    rename(new, old)


def test_client_renews_when_the_interface_has_changed_its_name(tmp_path):
    serve("eth0", "192.168.60", options=[(42, "ntp-server", ["192.168.60.5"])])
    write("eth0", dhcp_subnet(enabled=1, v6_mode="ra-only", lease_time=600), family=V6)  # stays under the old name
    fix_lease("eth0", "eth0", "192.168.60.99")
    (FILES / "wpad-eth0.conf").write_text("dhcp-option=tag:eth00,252,http://192.168.60.1/wpad.dat\n")
    switch("wpad-eth0")
    restart()
    with KeptLease("eth0", tmp_path, "-O", "wpad") as client:
        before = client.renew()
        assert (before["ip"], before["wpad"]) == ("192.168.60.99", "http://192.168.60.1/wpad.dat")
        with renamed("eth0", "ovs_eth0"):
            assert library.DHCPDConfChangeInterface(b"eth0", b"ovs_eth0") == 0
            restart()
            assert "interface=ovs_eth0" in served_lines()
            after = client.renew()
        names = ("ip", "router", "dns", "domain", "lease", "ntpsrv", "serverid", "wpad")
        assert {name: after.get(name) for name in names} == {name: before.get(name) for name in names}
    assert library.DHCPDConfChangeInterface(b"ovs_eth0", b"eth0") == 0
    restart()
    assert udhcpc("eth0", tmp_path)["router"] == "192.168.60.1"


@contextlib.contextmanager
def bridge_named(name, member):
    """Stands in for a bond, which not every kernel has: takes the interface's traffic."""
    run("ip", "link", "add", name, "type", "bridge")
    run("ip", "link", "set", member, "master", name)
    run("ip", "link", "set", name, "up")
    yield
    run("ip", "link", "del", name)


def test_interface_hands_its_service_to_the_bond_and_gets_it_back(tmp_path):
    serve("eth0", "192.168.60", first=10, last=20)
    write("bond0", v4_subnet("192.168.63", first=30, last=40))
    fix_lease("eth0", "eth0", "192.168.60.10")
    fix_lease("bond0", "eth0", "192.168.63.30")
    (FILES / "dhcpd-bond0.info").write_text('enable="no"\nbonding_backup_enable="yes"\n')
    restart()
    assert udhcpc("eth0", tmp_path)["ip"] == "192.168.60.10"

    with bridge_named("bond0", "eth0"):
        run("ip", "addr", "add", "192.168.63.1/24", "dev", "bond0")
        assert library.DHCPDLinkAggrSet(1, b"bond0", string_list(["eth0"])) == 0
        assert (FILES / "dhcpd-eth0.info").read_text() == 'enable="no"\nbonding_backup_enable="yes"\n'
        assert udhcpc("eth0", tmp_path)["ip"] == "192.168.63.30"

    assert library.DHCPDLinkAggrSet(0, b"bond0", string_list(["eth0"])) == 0
    assert udhcpc("eth0", tmp_path)["ip"] == "192.168.60.10"
    assert library.DHCPInterfaceIsEnabled(b"bond0", V4) == 0
