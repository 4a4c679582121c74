# box: --link eth0 --link lan0 --link lan1
# needs: vlan bonding bridge ppp pppoe
"""kovanet verify behind changes of VLANs, bonds and PPPoE, and when a connection or a relay is not what is stored."""

import pathlib
import shutil

import pytest
from conftest import DhcpServer, kill, kovanet, on_other_side, processes, run, wait_for
from pppoe_lab import (CONF, KOVAINFO, PASSWORD, RELAY_SETTINGS, SECRETS, USER, PppoeServer, nothing_is_left, relays,
                       write_bridge_files)
from test_kovanet import NETWORK, interface_file, kernel_addresses
from verify_lab import differences, expect_agreement

CARDS = {"eth0": "192.168.50", "lan0": "10.9.0", "lan1": "10.8.0"}
RELAY = str(RELAY_SETTINGS / "lbr0")


@pytest.fixture(autouse=True)
def machine(keep):
    """Three cards with a fixed address, as a boot leaves them; so it is again afterwards."""
    for path in (KOVAINFO, CONF, SECRETS, NETWORK):
        keep(path)
    for name, network in CARDS.items():
        on_other_side("ip", "addr", "replace", f"{network}.1/24", "dev", name)
        interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=static\nIPADDR={network}.7\n"
                                        "NETMASK=255.255.255.0\n")  # fmt: skip
    run("/etc/rc.network", "start", *CARDS)
    yield
    run("/usr/sbin/pppoe-stop")
    run("/etc/rc.network", "stop", status=None)
    for path in pathlib.Path("/etc/sysconfig/network-scripts").glob("ifcfg-*"):
        path.unlink()
    shutil.rmtree("/etc/dhcpd", ignore_errors=True)


# every command of a line behind the one before
CHANGES = {
    "VLAN": ["ipv6 set lan0 static 2001:db8:9::7/64 --yes", "vlan create lan0 10 keep --yes", "vlan remove lan0.10 --yes"],
    "VLAN without a lease": ["vlan create lan0 10 dhcp --yes"],
    "bond": ["mtu set lan0 1400 --yes", "ipv6 set lan0 auto --yes", "bond create bond0 802.3ad lan0 lan1 --yes",
             "bond change bond0 active-backup --yes", "vlan create bond0 30 static 10.30.0.7/24 --yes",
             "vlan remove bond0.30 --yes", "bond delete bond0 --yes"],
}  # fmt: skip


@pytest.mark.parametrize("what", CHANGES)
def test_verify_agrees_behind_a_change(what):
    for words in CHANGES[what]:
        kovanet(*words.split(), timeout=300)
        expect_agreement()


def test_verify_agrees_with_a_bond_that_takes_over_a_lease(tmp_path):
    with DhcpServer("lan0", "10.9.0", folder=tmp_path):
        kovanet("card", "set", "lan0", "dhcp")
        wait_for(lambda: kernel_addresses("lan0") not in ([], ["10.9.0.7/24"]), 30, "the lease")
        expect_agreement()
        kovanet("bond", "create", "bond0", "active-backup", "lan0", "lan1", "--yes", timeout=300)
        wait_for(lambda: kernel_addresses("bond0"), 60, "the lease of the bond")
        expect_agreement()


# ---- PPPoE ----------------------------------------------------------------------------------------------------------


def test_a_connection(tmp_path):
    """With the default route, up, then in every way not what is stored."""
    with PppoeServer(tmp_path):
        kovanet("gateway", "set", "192.168.50.1")
        kovanet("pppoe", "set", "eth0", "user", USER, "mtu", "1400", "default-route", "on", "--password-fd", "0",
                input=f"{PASSWORD}\n")  # fmt: skip
        kovanet("pppoe", "start", timeout=300)
        expect_agreement()

        kovanet("pppoe", "set", "lan1", "--keep-password")
        assert differences() == [(str(CONF), "ETH", "lan1", "eth0")]
        kovanet("pppoe", "set", "eth0", "--keep-password")
        run("ip", "route", "replace", "default", "via", "10.9.0.1", "dev", "lan0")
        assert differences() == [(str(CONF), "DEFAULTROUTE", "yes", "no")]
        run("ip", "route", "replace", "default", "dev", "ppp0")
        expect_agreement()
        wanted = KOVAINFO.read_text()
        KOVAINFO.write_text(wanted.replace('pppoe_enable="yes"', 'pppoe_enable="no"'))
        assert differences() == [(str(KOVAINFO), "pppoe_enable", "no", "yes")]
        KOVAINFO.write_text(wanted)

        kill(processes("/usr/sbin/pppd plugin pppoe.so"))
        wait_for(lambda: not pathlib.Path("/sys/class/net/ppp0").exists(), what="the loss")
        assert (str(KOVAINFO), "pppoe_enable", "yes", "dialling") in differences()
        kill(processes("/usr/sbin/pppoe-connect"))
        assert (str(KOVAINFO), "pppoe_enable", "yes", "no client") in differences()
        kovanet("pppoe", "stop", timeout=60)
        wait_for(nothing_is_left, what="the end of the connection")
        assert differences() == [(str(NETWORK), "GATEWAY", "192.168.50.1", "none")], "who was killed gave nothing back"

        kovanet("pppoe", "start", timeout=300)
        expect_agreement()
        kovanet("gateway", "set", "192.168.50.1")
        kovanet("pppoe", "stop", timeout=60)
        expect_agreement()


# ---- its relays -----------------------------------------------------------------------------------------------------


@pytest.fixture
def relay():
    """lbr0, a bridge of the local LAN with the port lan0, has its clients relayed to eth0."""
    write_bridge_files({"lbr0": "lan0"})
    run("/etc/rc.network", "start", "lbr0")
    kovanet("pppoe-relay", "set", "lbr0", "on", "eth0")
    kovanet("pppoe-relay", "apply", "lbr0")
    wait_for(relays, what="the relay in the background")
    yield
    run("/sbin/stop", "pppoerelay")
    shutil.rmtree(RELAY_SETTINGS, ignore_errors=True)


def test_a_relay_that_runs_and_one_that_does_not(relay):
    expect_agreement()
    run("/sbin/stop", "pppoerelay")
    assert differences() == [(RELAY, "enable", "yes", "no")]
    kovanet("pppoe-relay", "set", "lbr0", "off")
    expect_agreement()


def test_a_relay_that_is_not_applied_yet(relay):
    kovanet("pppoe-relay", "set", "lbr0", "on", "lan1")
    assert differences() == [(RELAY, "server", "lan1", "eth0")]
    kovanet("pppoe-relay", "set", "lbr0", "off")
    assert differences() == [(RELAY, "enable", "no", "yes")]
    kovanet("pppoe-relay", "clear")
    assert differences() == [(RELAY, "enable", "no", "yes")], "it runs on"
    kovanet("pppoe-relay", "apply", "lbr0")
    wait_for(lambda: not relays(), what="the relay's end")
    shutil.rmtree(RELAY_SETTINGS)
    expect_agreement()
