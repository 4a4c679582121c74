# box: --link eth0 --link lan0 --link lan1 --link lan2
# needs: bonding bridge vlan
"""The boot: all interface files become kernel state in one run of the network script, whatever stands among them."""

import json
import pathlib

import pytest
from conftest import run, wait_for

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
STATIC = "ONBOOT=yes\nBOOTPROTO=static\nNETMASK=255.255.255.0\nIPADDR="
FILES = {
    # a bridge whose port is a VLAN above a bond of two links: made from the bottom up, though listed from the top down
    "abr0": f"DEVICE=abr0\nTYPE=bridge\nPRIMARY=bond0.30\n{STATIC}192.168.81.5\n",
    "bond0": f'DEVICE=bond0\nBONDING_OPTS="mode=1 use_carrier=0 miimon=100 updelay=100"\n{STATIC}192.168.82.5\n',
    "bond0.30": "DEVICE=bond0.30\nVLAN_ROW_DEVICE=bond0\nVLAN_ID=30\nONBOOT=yes\nBRIDGE=abr0\n",
    "lan0": "DEVICE=lan0\nONBOOT=yes\nMASTER=bond0\nSLAVE=yes\n",
    "lan1": "DEVICE=lan1\nONBOOT=yes\nMASTER=bond0\nSLAVE=yes\n",
    "lan2": f"DEVICE=lan2\n{STATIC}192.168.83.5\n",
    "lan2.7": f"DEVICE=lan2.7\nVLAN_ROW_DEVICE=lan2\nVLAN_ID=7\n{STATIC}192.168.84.5\n",
    "eth0": "DEVICE=eth0\nONBOOT=no\nBOOTPROTO=dhcp\n",
}
MTUS = {"bond0": 2000, "lan2": 9000, "lan2.7": 8000}


@pytest.fixture
def files(keep):
    for name, text in FILES.items():
        keep(SCRIPTS / f"ifcfg-{name}").write_text(text)
    with open(keep("/etc/kovainfo.conf"), "a") as info:
        info.write("".join(f'{name}_mtu="{mtu}"\n' for name, mtu in MTUS.items()))
    run("ip", "link", "set", "eth0", "down")
    yield
    run("/etc/rc.network", "stop", *FILES)
    run("ip", "link", "set", "lan2", "mtu", "1500")


def links():
    """What there is: name -> kind, master, below, addresses, whether up."""
    found = {}
    for link in json.loads(run("ip", "-j", "-d", "addr", "show").stdout):
        ipv4 = [one["local"] for one in link["addr_info"] if one["family"] == "inet"]
        kind = link.get("linkinfo", {}).get("info_kind")
        found[link["ifname"]] = (kind, link.get("master"), link.get("link"), ipv4, "UP" in link["flags"])
    del found["lo"]
    return found


WANTED = {
    "eth0": ("veth", None, None, [], False),
    "lan0": ("veth", "bond0", None, [], True),
    "lan1": ("veth", "bond0", None, [], True),
    "lan2": ("veth", None, None, ["192.168.83.5"], True),
    "bond0": ("bond", None, None, ["192.168.82.5"], True),
    "abr0": ("bridge", None, None, ["192.168.81.5"], True),
    "bond0.30": ("vlan", "abr0", "bond0", [], True),
    "lan2.7": ("vlan", None, "lan2", ["192.168.84.5"], True),
}
STOPPED = {name: ("veth", None, None, [], False) for name in ("eth0", "lan0", "lan1", "lan2")}


def mtus():
    return {name: int(pathlib.Path(f"/sys/class/net/{name}/mtu").read_text()) for name in MTUS}


def test_boot_and_shutdown(files):
    for _ in range(2):  # what is there already is left as it is
        assert run("/etc/rc.network", "start").stderr == ""
        assert links() == WANTED
        assert mtus() == MTUS
    hardware = [pathlib.Path(f"/sys/class/net/{name}/address").read_text() for name in ("abr0", "bond0.30", "lan0")]
    assert len(set(hardware)) == 1

    run("/etc/rc.network", "stop", "lan0", "bond0")  # with everything above them
    assert links() == {**STOPPED, "lan2": WANTED["lan2"], "lan2.7": WANTED["lan2.7"], "abr0": WANTED["abr0"]}
    run("/etc/rc.network", "start", "bond0")
    assert links() == WANTED
    run("/etc/rc.network", "restart")
    assert links() == WANTED
    for _ in range(2):
        assert run("/etc/rc.network", "stop").stderr == ""
        assert links() == STOPPED


def test_what_is_wrong_costs_nothing_else(files, keep, system_log):
    for name, text in {"gone0": STATIC + "1.2.3.4\n", "lan0.tmp1700000000": "MASTER=bond9\n", "lan2.saved": "TYPE=bridge\n",
                       "bond1": 'BONDING_OPTS="mode=77"\nONBOOT=yes\n', "lan1.9": "VLAN_ROW_DEVICE=gone0\nVLAN_ID=9\n"
                       "ONBOOT=yes\n", "lan2.4095": "VLAN_ROW_DEVICE=lan2\nVLAN_ID=4095\nONBOOT=yes\n"}.items():  # fmt: skip
        keep(SCRIPTS / f"ifcfg-{name}").write_text(text)
    (keep(SCRIPTS / "ifcfg-noise")).write_bytes(b"\xff\x00\nONBOOT=yes\x00\nMASTER")
    told = run("/etc/rc.network", "start", status=1).stderr
    for message in ("gone0: there is no such interface", "bond1: cannot make a bond with mode=77",
                    'lan1.9: no row device "gone0"', "lan2.4095: cannot make the VLAN"):  # fmt: skip
        assert message in told
        wait_for(lambda message=message: system_log.holds(message), what="the message in the system log")
    assert links() == WANTED
    run("/etc/rc.network", "stop", status=1)
    assert links() == STOPPED


def test_a_port_that_is_a_vlan_has_its_jumbo_mtu(files, keep):
    keep(SCRIPTS / "ifcfg-lan2.8").write_text("DEVICE=lan2.8\nVLAN_ROW_DEVICE=lan2\nVLAN_ID=8\nONBOOT=yes\nBRIDGE=abr1\n")
    keep(SCRIPTS / "ifcfg-abr1").write_text(f"DEVICE=abr1\nTYPE=bridge\nPRIMARY=lan2.8\n{STATIC}192.168.85.5\n")
    with open("/etc/kovainfo.conf", "a") as info:
        info.write('lan2.8_mtu="9000"\n')
    for verb in ("start", "restart"):
        assert run("/etc/rc.network", verb).stderr == ""
        found = json.loads(run("ip", "-j", "link", "show").stdout)
        assert {link["ifname"]: (link["mtu"], link.get("master")) for link in found if link["ifname"].startswith("lan2")} == {
            "lan2": (9000, None), "lan2.7": (8000, None), "lan2.8": (9000, "abr1")}
    run("/etc/rc.network", "stop", "abr1", "lan2.8")


def test_what_a_stop_took_down_comes_back_though_it_is_not_for_the_boot(files, keep):
    run("/etc/rc.network", "start")
    for name in ("lan0", "lan1"):
        path = keep(SCRIPTS / f"ifcfg-{name}")
        path.write_text(path.read_text().replace("ONBOOT=yes", "ONBOOT=no"))
    run("/etc/rc.network", "stop", "bond0")
    assert links()["lan0"] == STOPPED["lan0"] and "bond0" not in links()
    run("/etc/rc.network", "start", "bond0")
    assert links() == WANTED
