# box: --link eth0 --link eth1 --link eth2
# needs: vlan bonding dummy
"""The recipes of the documentation, each block run as printed, one after the other in one shell."""

import json
import pathlib
import re
import subprocess

import pytest
from conftest import SLOWNESS, data, on_other_side, run, wait_for
from test_kovanet import NETWORK, SCRIPTS, default_gateway, ip, kernel_addresses

DOCUMENT = pathlib.Path(__file__).resolve().parents[2] / "docs" / "recipes.md"
SECTIONS = dict(re.findall(r"^## (.+?)\n(.*?)(?=^## |\Z)", DOCUMENT.read_text(), re.MULTILINE | re.DOTALL))
BLOCKS = {title: re.findall(r"```sh\n(.*?)```", text, re.DOTALL) for title, text in SECTIONS.items()}
TRIED = set(re.findall(r"follow\(\s*\"(.+?)\"", pathlib.Path(__file__).read_text()))
FIXED_ADDRESSES = pathlib.Path("/etc/dhcpd/dhcpd-eth1-static.conf")
CARDS = ("eth0", "eth1", "eth2")


@pytest.fixture(autouse=True)
def machine():
    """Three static cards, the other side of eth0 a router; all as before afterwards."""
    on_other_side("ip", "addr", "replace", "192.168.50.1/24", "dev", "eth0")
    on_other_side("ip", "addr", "replace", "10.1.10.1/24", "dev", "eth1")
    for number, name in enumerate(CARDS):
        on_other_side("ip", "link", "set", name, "up")
        (SCRIPTS / f"ifcfg-{name}").write_text(
            f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.{70 + number}.2\nNETMASK=255.255.255.0\n")
    run("/etc/rc.network", "start", *CARDS)
    yield
    run("/etc/rc.network", "stop", status=None)
    for path in [*SCRIPTS.glob("ifcfg-*"), NETWORK]:
        path.unlink(missing_ok=True)
    NETWORK.touch()
    on_other_side("ip", "addr", "flush", "dev", "eth1", "scope", "global")


def follow(title, *steps, minute=120):
    """
    Runs the blocks of a recipe in one shell that ends at the first command that fails; after each the step of the same
    place looks at what came of it.
    """
    blocks = BLOCKS[title]
    assert len(steps) == len(blocks)
    shell = subprocess.Popen(["/bin/sh", "-e"], stdin=subprocess.PIPE, stdout=subprocess.PIPE, stderr=subprocess.STDOUT,
                             text=True, env={"PATH": "/usr/sbin:/usr/bin:/sbin:/bin", "MINUTE": str(minute)})
    try:
        for number, (block, step) in enumerate(zip(blocks, steps)):
            shell.stdin.write(f"{block}\necho '--- {number}'\n")
            shell.stdin.flush()
            printed = ""
            while f"--- {number}\n" not in printed:
                line = shell.stdout.readline()
                assert line, f"the recipe failed:\n{block}\n{printed}"
                printed += line
            step(printed)
    finally:
        shell.stdin.close()
        shell.wait(timeout=120 * SLOWNESS)
        shell.stdout.close()


def is_done(_):
    pass


def has_address(name, address):
    assert kernel_addresses(name) == [address]


def test_a_static_card():
    def is_static(_):
        has_address("eth0", "192.168.50.10/24")
        assert default_gateway() == ("192.168.50.1", "eth0")

    def agrees(printed):
        assert "the kernel agrees with the files" in printed

    follow("Make a card static and survive a mistake", is_static, agrees)


def test_the_way_back_from_a_mistake():
    """The same without anybody who stops it."""
    title = "Make a card static and survive a mistake"
    subprocess.run(["/bin/sh", "-e"], input=BLOCKS[title][0], text=True, check=True, timeout=120 * SLOWNESS,
                   env={"PATH": "/usr/sbin:/usr/bin:/sbin:/bin", "MINUTE": "1"}, stdout=subprocess.DEVNULL)
    wait_for(lambda: kernel_addresses("eth0") == ["192.168.70.2/24"], what="the way back")


def test_name_servers():
    def uses_them(printed):
        assert "servers:    192.168.50.1 2001:db8:50::1\n" in printed

    follow("Use name servers of your own", uses_them)


def test_a_vlan():
    def is_vlan(_):
        has_address("eth1.10", "10.1.10.2/24")
        assert kernel_addresses("eth1") == []

    follow("Put a card into a VLAN", is_vlan, lambda _: has_address("eth1", "10.1.10.2/24"))


def test_a_bond():
    def runs(mode):
        def step(_):
            bond = data("bond", "show", "bond0")
            assert (bond["mode"], bond["members"]) == (mode, ["eth1", "eth2"])
            has_address("bond0", "192.168.71.2/24")
        return step

    follow("Bond two ports", runs("active-backup"), runs("802.3ad"), lambda _: has_address("eth1", "192.168.71.2/24"))
    assert data("bond", "list") == []


def test_large_packets():
    on_other_side("ip", "link", "set", "eth1", "mtu", "9000")
    follow("Use large packets", is_done)
    assert ip("link", "show", "dev", "eth1")[0]["mtu"] == 9000


def test_a_dhcp_server():
    def lease():
        got = on_other_side("busybox", "udhcpc", "-n", "-q", "-f", "-t", "30", "-T", "1", "-i", "eth1", "-s", "/bin/true")
        return got.stdout + got.stderr

    def serves(_):
        assert re.search(r"lease of 192\.168\.60\.(1\d\d|200) ", lease())

    def serves_the_fixed_address(_):
        on_other_side("ip", "link", "set", "eth1", "address", "52:54:00:12:34:56")
        assert "lease of 192.168.60.20 " in lease()

    mac = json.loads(on_other_side("ip", "-j", "link", "show", "dev", "eth1").stdout)[0]["address"]
    try:
        follow("Serve DHCP on a second port", serves, serves_the_fixed_address)
    finally:
        on_other_side("ip", "link", "set", "eth1", "address", mac)
        FIXED_ADDRESSES.unlink(missing_ok=True)
        run("/usr/bin/kovanet", "dhcp-server", "off")


def test_a_wait_for_a_link():
    on_other_side("ip", "link", "set", "eth2", "down")
    wait_for(lambda: data("link", "show", "eth2")[0]["link"] == "down", what="the end of the link")
    other_end = subprocess.Popen(["sh", "-c", f"sleep {2 * SLOWNESS}; ip netns exec net ip link set eth2 up"])
    follow("Have a script wait for a link", lambda printed: printed.index("eth2 has a link"))
    other_end.wait(timeout=120 * SLOWNESS)
    assert data("link", "show", "eth2")[0]["link"] == "up"


def test_questions():
    def answered(printed):
        assert "broadcast address" in printed and "not that one" in printed
    follow("Find out what a change would need", answered)


def test_what_differs():
    run("ip", "addr", "flush", "dev", "eth2", "scope", "global")

    def is_told(printed):
        assert '"key":"IPADDR","wanted":"192.168.72.2","actual":"none"' in printed and "not what the files say" in printed

    follow("Look for what differs from the files", is_told)


def test_every_recipe_was_tried():
    assert set(BLOCKS) == TRIED
