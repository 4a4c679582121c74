# needs: vlan
"""kovanet vlan with addresses from real DHCP servers, of which the untagged network and the VLAN have one each."""

import pathlib

import pytest
from capture import captured
from conftest import (SLOWNESS, DhcpServer, addresses, data, keys_of, kovanet, on_other_side, processes, routes, run,
                      wait_for)

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
ETH0, VLAN = SCRIPTS / "ifcfg-eth0", SCRIPTS / "ifcfg-eth0.20"
DHCP_ETH0 = "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=dhcp\n"
STATIC_ETH0 = "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.50.99\nNETMASK=255.255.255.0\n"
IPV4, BROADCAST = 0x0800, b"\xff" * 6
DHCP_SERVER_PORT = (67).to_bytes(2, "big")


@pytest.fixture(autouse=True)
def wired(keep):
    """The partner has the VLAN 20, and nothing is left of what was tried."""
    for path in ("/etc/kovainfo.conf", ETH0, VLAN, "/etc/sysconfig/network", "/etc/resolv.conf"):
        keep(path)
    on_other_side("ip", "-batch", "-", input="link add link eth0 name eth0.20 type vlan id 20\nlink set eth0 up\n"
                                             "link set eth0.20 up\n")  # fmt: skip
    yield
    if VLAN.exists():
        run("/etc/rc.network", "stop", "eth0.20")
    run("/etc/rc.network", "stop", "eth0")
    on_other_side("ip", "-batch", "-", input="link del eth0.20\naddr flush dev eth0\n")
    for link in ("eth0", "eth0.20"):
        pathlib.Path(f"/tmp/dhcpv4.leases.{link}").unlink(missing_ok=True)


@pytest.fixture
def untagged_server(tmp_path):
    with DhcpServer("eth0", "192.168.50", "--dhcp-option=option:router,192.168.50.1", folder=tmp_path) as server:
        yield server


def server_on_vlan(folder):
    return DhcpServer("eth0.20", "192.168.70", "--dhcp-option=option:router,192.168.70.1", folder=folder)


def start(text):
    ETH0.write_text(text)
    run("/etc/rc.network", "start", "eth0")


def leased(link, network):
    """The address that an interface gets in a network of the other side, with the default route it comes with."""
    [address] = wait_for(lambda: addresses(link), what=f"a lease on {link}")
    assert address.startswith(f"{network}.") and address.endswith("/24")
    route = [f"default via {network}.1 dev {link}"]
    wait_for(lambda: routes("default") == route, what="the default route of the lease")
    return address.removesuffix("/24")


def clients():
    """The interfaces that a DHCP client works on."""
    return sorted(link for link in ("eth0", "eth0.20") if processes(f"/tmp/dhcpv4.leases.{link} "))


def vlans_of_questions(frames):
    """The VLANs in which DHCP clients ask."""
    return {frame.vlan for frame in frames
            if (frame.protocol, frame.target, frame.content[36:38]) == (IPV4, BROADCAST, DHCP_SERVER_PORT)}  # fmt: skip


def test_a_vlan_leases_in_its_own_network_and_gives_the_client_back(untagged_server, tmp_path):
    start(DHCP_ETH0)
    leased("eth0", "192.168.50")
    assert clients() == ["eth0"]
    asked_untagged = untagged_server.text().count("DHCPACK(eth0)")

    with server_on_vlan(tmp_path) as server:
        with captured("eth0") as frames:
            assert kovanet("vlan", "create", "eth0", "20", "dhcp", "--yes").stdout == ""
            address = leased("eth0.20", "192.168.70")
        assert f"DHCPACK(eth0.20) {address} " in server.text()
        assert vlans_of_questions(frames) == {20}
        assert untagged_server.text().count("DHCPACK(eth0)") == asked_untagged
        assert addresses("eth0") == [] and clients() == ["eth0.20"]
        assert VLAN.read_text() == "DEVICE=eth0.20\nVLAN_ROW_DEVICE=eth0\nVLAN_ID=20\nONBOOT=yes\nBOOTPROTO=dhcp\n"
        assert ETH0.read_text() == "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=none\nIPV6INIT=off\n"
        assert data("vlan", "list") == [{"name": "eth0.20", "row_device": "eth0", "id": 20, "up": True, "link": "up",
                                         "address": address, "prefix": 24}]
        run("ping", "-c", "1", "-W", str(5 * SLOWNESS), "192.168.70.1")

        assert kovanet("vlan", "remove", "eth0.20", "--yes").stdout == ""
    leased("eth0", "192.168.50")
    assert clients() == ["eth0"] and data("vlan", "list") == []
    assert not VLAN.exists() and not pathlib.Path("/etc/dhclient/ipv4/dhcpcd-eth0.20.info").exists()
    assert ETH0.read_text() == DHCP_ETH0


def test_keep_goes_on_with_dhcp_in_the_vlan(untagged_server, tmp_path):
    start(DHCP_ETH0)
    leased("eth0", "192.168.50")
    with server_on_vlan(tmp_path):
        kovanet("vlan", "create", "eth0", "20", "keep", "--yes")
        leased("eth0.20", "192.168.70")


def test_a_static_interface_comes_back_with_dhcp(untagged_server, tmp_path):
    start(STATIC_ETH0)
    with server_on_vlan(tmp_path):
        kovanet("vlan", "create", "eth0", "20", "dhcp", "--yes")
        leased("eth0.20", "192.168.70")
        kovanet("vlan", "remove", "eth0.20", "--yes")
    assert leased("eth0", "192.168.50") != "192.168.50.99"
    assert keys_of(ETH0) == {"DEVICE": "eth0", "ONBOOT": "yes", "BOOTPROTO": "dhcp"}


def test_a_vlan_without_a_server_is_made_and_waits_for_one(tmp_path):
    start(STATIC_ETH0)
    kovanet("vlan", "create", "eth0", "20", "dhcp", "--yes")
    assert data("vlan", "show", "eth0.20")["address"] is None
    assert clients() == ["eth0.20"]
    with server_on_vlan(tmp_path):
        leased("eth0.20", "192.168.70")
