# box: --ovs-bonds tests/lab/switch_bonds --link eth0 --link lan0 --link lan1
# needs: bonding openvswitch
"""The virtual switch's own devices: a port over eth0 and a bond of lan0 and lan1, read and worked on by library, tool and
network script, and compared with what the switch and iproute2 say. The switch keeps all that it has through every test."""

import ctypes
import pathlib

import pytest
from conftest import (
    CALL_FAILED, NO, Daemon, addresses, asked, complaint, data, documented, is_up, keys_of, kovanet, on_other_side, run,
    wait_for, wait_for_partner,
)  # fmt: skip
from dhcp_lab import FILES, clean_server, serve, served_lines, udhcpc
from sdk import STATIC, Bond, EthInfo, card, interfaces, library, register, set_card
from test_kovanet import SCRIPTS, interface_file, ip, link_of

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


@pytest.fixture(autouse=True)
def configured(keep):
    """Everything up by its file; the switch is in the end what it was."""
    keep(KOVAINFO)
    for name in ("eth0", *MEMBERS):
        write(name, "BOOTPROTO=none\n")
    write("ovs_eth0", STATIC_FILE.format("192.168.50.10"))
    write("ovs_bond0", BOND_FILE.format(MODES[6][0]))
    on_other_side("ip", "addr", "replace", "192.168.50.1/24", "dev", "eth0")
    run("/etc/rc.network", "start")
    wait_for(lambda: member_states() == dict.fromkeys(MEMBERS, "enabled"), 30, "both members")
    before = of_switch()
    yield
    assert of_switch() == before
    for path in SCRIPTS.glob("ifcfg-*"):
        path.unlink()


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
        assert [name for name in sorted(ip_names()) if question(name.encode())] == MEMBERS
    assert not any(library.KLIBNetBridgeIfIsSlave(name.encode()) for name in ip_names()), "a switch is no kernel's bridge"


def ip_names():
    return [link["ifname"] for link in ip("link", "show")]
