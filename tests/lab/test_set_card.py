"""The main job on a real interface: static, DHCP with a real lease, static again, with failures in the middle."""
import pathlib
import subprocess

import pytest
import sdk
from conftest import DhcpServer, addresses, on_other_side, run, wait_for

IFCFG = pathlib.Path("/etc/sysconfig/network-scripts/ifcfg-eth0")
LEASE = pathlib.Path("/etc/dhclient/ipv4/dhcpcd-eth0.info")
EVENTS = pathlib.Path("/tmp/events")
PLUGIN = pathlib.Path("/usr/kova/plugins/net/ipv4_change/50-note")
ADDRESS, MASK = "192.168.50.10", "255.255.255.0"


def keys():
    return dict(line.split("=", 1) for line in IFCFG.read_text().splitlines() if "=" in line)


def beside():
    """What lies beside the interface file: no backup, no temporary may stay."""
    return sorted(path.name for path in IFCFG.parent.iterdir() if path.name != "README")


@pytest.fixture(autouse=True)
def appliance():
    """eth0 up without an address, and a plug-in that keeps what it is told."""
    IFCFG.write_text("# kept as it is\nDEVICE=eth0\nBOOTPROTO=static\nONBOOT=yes\nMASTER=bond0\nUSERCTL=\"no\"\n")
    EVENTS.unlink(missing_ok=True)
    PLUGIN.parent.mkdir(parents=True, exist_ok=True)
    PLUGIN.write_text(f"#!/bin/sh\n{{ echo \"$PLUGIN_PHASE\"; cat; }} >> {EVENTS}\n")
    PLUGIN.chmod(0o755)
    run("ip", "addr", "flush", "dev", "eth0")
    run("ip", "link", "set", "eth0", "up")
    on_other_side("ip", "addr", "replace", "192.168.50.1/24", "dev", "eth0")
    wait_for(lambda: "state UP" in run("ip", "link", "show", "eth0").stdout, what="carrier")
    yield
    subprocess.run(["/sbin/stop", "dhcp-client", "IFACE=eth0"], check=True)


@pytest.fixture
def broken_tool():
    """Makes a tool fail, and mends it afterwards."""
    saved = {}

    def break_it(path, status):
        tool = pathlib.Path(path).resolve()
        saved[tool] = (tool.read_bytes(), tool.stat().st_mode)
        tool.unlink()
        tool.write_text(f"#!/bin/sh\nexit {status}\n")
        tool.chmod(0o755)

    yield break_it
    for tool, (content, mode) in saved.items():
        tool.unlink()
        tool.write_bytes(content)
        tool.chmod(mode & 0o7777)


def make_static(address=ADDRESS, mask=MASK, old=None):
    return sdk.set_card(sdk.card(sdk.STATIC, "eth0", address, mask), old)


def test_static_reaches_the_neighbour_and_is_announced():
    assert make_static() == 0, sdk.register()
    assert addresses("eth0") == [f"{ADDRESS}/24"]
    run("ping", "-c", "1", "-W", "5", "192.168.50.1")
    assert EVENTS.read_text().splitlines() == [
        "PRE", "PLUGIN_EVENT=net/ipv4_change", "PLUGIN_PHASE=PRE", "IFNAME=eth0", "ORIGIN_ADDRESS=",
        f"NEW_ADDRESS={ADDRESS}", "PREFIX_LENGTH=-1", "IS_LINK=true"]
    assert IFCFG.read_text() == ("# kept as it is\nDEVICE=eth0\nBOOTPROTO=static\nONBOOT=yes\nUSERCTL=\"no\"\n"
                                 f"IPADDR={ADDRESS}\nNETMASK={MASK}\n")
    assert beside() == ["ifcfg-eth0"]


def test_static_to_dhcp_to_static(tmp_path):
    assert make_static() == 0, sdk.register()
    with DhcpServer("eth0", "192.168.50", folder=tmp_path):
        assert sdk.set_card(sdk.card(sdk.DHCP, "eth0")) == 0, sdk.register()
        assert keys()["BOOTPROTO"] == "dhcp" and "IPADDR" not in keys()
        wait_for(LEASE.exists)
        lease = dict(line.split("=", 1) for line in LEASE.read_text().splitlines())
        leased = lease["IPADDR"].strip('"')
        wait_for(lambda: f"{leased}/24" in addresses("eth0"))
        found = sdk.get_card(0)
        assert (found.nIPSource, found.szIfname, found.szIP.decode()) == (sdk.DHCP, b"eth0", leased)
        run("ping", "-c", "1", "-W", "5", "192.168.50.1")
        assert make_static() == 0, sdk.register()
    assert addresses("eth0") == [f"{ADDRESS}/24"]
    found = sdk.get_card(0)
    assert (found.nIPSource, found.szIP.decode(), found.szMask.decode()) == (sdk.STATIC, ADDRESS, MASK)


@pytest.mark.parametrize("tool", ["/sbin/ifconfig"])
def test_failing_step_leaves_the_old_file_byte_for_byte(tool, broken_tool, tmp_path):
    with DhcpServer("eth0", "192.168.50", folder=tmp_path):
        assert sdk.set_card(sdk.card(sdk.DHCP, "eth0")) == 0, sdk.register()
        wait_for(lambda: addresses("eth0"))
        before, owner = IFCFG.read_bytes(), IFCFG.stat()
        broken_tool(tool, 3)
        assert make_static() == -1
        assert IFCFG.read_bytes() == before
        assert (IFCFG.stat().st_mode, IFCFG.stat().st_uid) == (owner.st_mode, owner.st_uid)
        assert beside() == ["ifcfg-eth0"]


def test_missing_tool_leaves_the_old_file_byte_for_byte(broken_tool):
    before = IFCFG.read_bytes()
    broken_tool("/sbin/ifconfig", 0)
    pathlib.Path("/sbin/ifconfig").resolve().chmod(0o644)
    assert make_static() == -1
    assert IFCFG.read_bytes() == before and beside() == ["ifcfg-eth0"]


def test_killed_tool_leaves_the_old_file_byte_for_byte(broken_tool):
    before = IFCFG.read_bytes()
    broken_tool("/sbin/ifconfig", 0)
    pathlib.Path("/sbin/ifconfig").resolve().write_text("#!/bin/sh\nkill -9 $$\n")
    assert make_static() == -1
    assert IFCFG.read_bytes() == before and beside() == ["ifcfg-eth0"]


def test_client_that_cannot_start_loses_nothing(broken_tool):
    before = IFCFG.read_bytes()
    broken_tool("/sbin/start", 1)
    assert sdk.set_card(sdk.card(sdk.DHCP, "eth0")) == -1
    assert sdk.register() == (0x2A00, "net_set_card1")
    assert IFCFG.read_bytes() == before


@pytest.mark.parametrize("address, mask", [("192.168.50.255", MASK), ("224.0.0.1", MASK), ("192.168.50.10", "0.0.0.0"),
                                           ("", MASK), ("192.168.50.10", ""), ("1.2.3.4.5", MASK)])
def test_refused_address_changes_nothing(address, mask):
    before = IFCFG.read_bytes()
    assert make_static(address, mask) == -1
    assert IFCFG.read_bytes() == before
    assert addresses("eth0") == [] and not EVENTS.exists()


def test_unchanged_address_raises_no_event():
    assert make_static() == 0, sdk.register()
    EVENTS.unlink()
    assert make_static() == 0, sdk.register()
    assert not EVENTS.exists()
    assert addresses("eth0") == [f"{ADDRESS}/24"]


def test_failing_plugin_does_not_undo_the_change():
    PLUGIN.write_text("#!/bin/sh\nexit 1\n")
    assert make_static() == 0, sdk.register()
    assert addresses("eth0") == [f"{ADDRESS}/24"]


def test_lock_held_elsewhere_is_reported_and_nothing_changes():
    before = IFCFG.read_bytes()
    holder = subprocess.Popen(["/usr/bin/python3", "-c", "import ctypes, sys\n"
                               "c = ctypes.CDLL('libkovacore.so.6')\n"
                               "assert c.KLIBCFileLock(0x105, 5) == 0\nprint('held', flush=True)\nsys.stdin.read()"],
                              stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True)
    try:
        assert holder.stdout.readline() == "held\n"
        assert make_static() == -1
        assert sdk.register()[0] == 0x400
        assert IFCFG.read_bytes() == before
    finally:
        holder.kill()
        holder.wait()
    assert make_static() == 0, "the lock of a dead process is free"
