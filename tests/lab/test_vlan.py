# needs: flower vlan
"""VLANs: made and removed by the library on a running interface, with a partner that has the VLAN, too."""

import ctypes
import pathlib

import pytest
from capture import captured
from conftest import SLOWNESS, DhcpServer, addresses, is_up, on_other_side, routes, run, wait_for
from sdk import DHCP, STATIC, VlanInfo, card, library, register

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
INFO = pathlib.Path("/etc/kovainfo.conf")
ETH0, VLAN = SCRIPTS / "ifcfg-eth0", SCRIPTS / "ifcfg-eth0.10"
STATIC_ETH0 = "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.50.10\nNETMASK=255.255.255.0\nIPV6INIT=auto\n"
VLAN_FILE = ("DEVICE=eth0.10\nVLAN_ROW_DEVICE=eth0\nVLAN_ID=10\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.50.10\n"
             "NETMASK=255.255.255.0\nIPV6INIT=auto\n")  # fmt: skip
BAD_PARAMETER, EXISTS, REFUSED = 0xD00, 0xBB00, 0x8100
IPV4 = 0x0800


@pytest.fixture(autouse=True)
def static_eth0(keep):
    """eth0 with a static address; the partner has the VLAN 10 and waits, without addresses, for what is tried."""
    for path in (INFO, ETH0, VLAN, "/etc/sysconfig/network"):
        keep(path)
    ETH0.write_text(STATIC_ETH0)
    on_other_side("ip", "-batch", "-", input="link add link eth0 name eth0.10 type vlan id 10\nlink set eth0 up\n"
                                             "link set eth0.10 up\n")  # fmt: skip
    run("/etc/rc.network", "start", "eth0")
    yield
    if VLAN.exists():
        run("/etc/rc.network", "stop", "eth0.10")
    run("/etc/rc.network", "stop", "eth0")
    on_other_side("ip", "-batch", "-", input="link del eth0.10\naddr flush dev eth0\nlink set eth0 mtu 1500\n")
    run("ip", "link", "set", "eth0", "mtu", "1500")


def partner_at(link, mtu=1500):
    """The partner's address is 192.168.50.1, on this interface of it and on no other."""
    other = "eth0.10" if link == "eth0" else "eth0"
    on_other_side("ip", "-batch", "-", input=f"addr flush dev {other}\nlink set eth0 mtu {mtu}\n"
                                             f"link set eth0.10 mtu {mtu}\naddr replace 192.168.50.1/24 dev {link}\n")  # fmt: skip


def ping(*options):
    run("ping", "-c", "1", "-W", str(5 * SLOWNESS), *options, "192.168.50.1")


def ping_seen(link):
    """The VLANs of the IPv4 frames that reach the partner while it is pinged at an interface."""
    partner_at(link)
    with captured("eth0") as frames:
        ping()
        wait_for(lambda: any(frame.protocol == IPV4 for frame in frames), what="a frame")
    return {frame.vlan for frame in frames if frame.protocol == IPV4}


def create(rowdev="eth0", vlan_id=10, source=STATIC):
    address = ("192.168.50.10", "255.255.255.0") if source == STATIC else ()
    return library.KLIBNetVlanCreate(rowdev.encode(), vlan_id, ctypes.byref(card(source, rowdev, *address)))


def remove(name="eth0.10"):
    return library.KLIBNetVlanRemove(name.encode())


def vlan_of_kernel(name):
    found = VlanInfo()
    return (library.KLIBNetVlanGet(name.encode(), ctypes.byref(found)), found.szRowDevice.decode(), found.vlanId)


def mtu(link):
    return int(pathlib.Path(f"/sys/class/net/{link}/mtu").read_text())


def test_the_address_moves_to_the_vlan_and_back(keep):
    keep("/etc/sysconfig/network").write_text("GATEWAY=192.168.50.1\n")
    run("/etc/rc.network", "start", "eth0")
    assert ping_seen("eth0") == {None}

    assert create() == 0, register()
    assert addresses("eth0.10") == ["192.168.50.10/24"] and addresses("eth0") == []
    assert vlan_of_kernel("eth0.10") == (1, "eth0", 10)
    assert is_up("eth0") and is_up("eth0.10")
    assert VLAN.read_text() == VLAN_FILE
    assert ETH0.read_text() == "DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=none\nIPV6INIT=off\n"
    assert pathlib.Path("/proc/sys/net/ipv6/conf/eth0/disable_ipv6").read_text() == "1\n"
    assert routes("default") == ["default via 192.168.50.1 dev eth0.10"]
    assert ping_seen("eth0.10") == {10}

    assert remove() == 0, register()
    assert addresses("eth0") == ["192.168.50.10/24"]
    assert not pathlib.Path("/sys/class/net/eth0.10").exists() and not VLAN.exists()
    assert ETH0.read_text() == ("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.50.10\n"
                                "NETMASK=255.255.255.0\nIPV6INIT=auto\n")  # fmt: skip
    assert pathlib.Path("/proc/sys/net/ipv6/conf/eth0/disable_ipv6").read_text() == "0\n"
    assert routes("default") == ["default via 192.168.50.1 dev eth0"]
    assert ping_seen("eth0") == {None}
    assert {path.name for path in SCRIPTS.iterdir()} == {"ifcfg-eth0"}


def ipv6_addresses(link):
    """The IPv6 addresses of an interface, but for the one that belongs to its link."""
    return [word for word in run("ip", "-6", "-o", "addr", "show", "dev", link, "scope", "global").stdout.split()
            if "/" in word]  # fmt: skip


def test_the_ipv6_settings_move_to_the_vlan_and_back():
    with_ipv6 = STATIC_ETH0.replace("IPV6INIT=auto\n", "IPV6INIT=static\nIPV6ADDR=2001:db8:50::5\nIPV6PREFIXLENG=64\n"
                                    "IPV6_DEFAULTGW=2001:db8:50::1\nIPV6DNS=2001:db8:50::53\n")  # fmt: skip
    ETH0.write_text(with_ipv6)
    run("/etc/rc.network", "start", "eth0")
    assert ipv6_addresses("eth0") == ["2001:db8:50::5/64"]

    assert create() == 0, register()
    assert (ipv6_addresses("eth0"), ipv6_addresses("eth0.10")) == ([], ["2001:db8:50::5/64"])
    assert "default via 2001:db8:50::1 dev eth0.10 " in run("ip", "-6", "route", "show", "default").stdout
    assert VLAN.read_text() == VLAN_FILE.replace("IPV6INIT=auto\n", with_ipv6[with_ipv6.index("IPV6INIT") :])
    assert ETH0.read_text() == ("DEVICE=eth0\nONBOOT=yes\nIPV6ADDR=2001:db8:50::5\nIPV6PREFIXLENG=64\n"
                                "BOOTPROTO=none\nIPV6INIT=off\n")  # fmt: skip

    assert remove() == 0, register()
    assert ipv6_addresses("eth0") == ["2001:db8:50::5/64"]
    assert "default via 2001:db8:50::1 dev eth0 " in run("ip", "-6", "route", "show", "default").stdout
    assert ETH0.read_text() == with_ipv6


def test_a_vlan_gets_a_lease_of_its_own_network(tmp_path):
    with DhcpServer("eth0.10", "192.168.70", folder=tmp_path):
        assert create(source=DHCP) == 0, register()
        leased = wait_for(lambda: addresses("eth0.10"), what="a lease")
        assert leased[0].startswith("192.168.70.") and addresses("eth0") == []
        assert remove() == 0, register()
    assert "BOOTPROTO=dhcp\n" in ETH0.read_text()
    run("/etc/rc.network", "stop", "eth0")


def test_there_is_one_vlan_above_an_interface_and_none_above_a_vlan():
    assert create() == 0, register()
    before = (ETH0.read_text(), VLAN.read_text(), run("ip", "-br", "addr").stdout)
    assert (create(vlan_id=20), register()[0]) == (-1, EXISTS)
    assert (create(), register()[0]) == (-1, EXISTS)
    assert (create(rowdev="eth0.10", vlan_id=20), register()[0]) == (-1, BAD_PARAMETER)
    assert (ETH0.read_text(), VLAN.read_text(), run("ip", "-br", "addr").stdout) == before
    assert remove("eth0") == -1


def test_a_jumbo_mtu_reaches_the_row_device_and_lasts():
    assert create() == 0, register()
    assert library.KOVANetSetMTUValue(b"9000", b"eth0.10") == 0, register()
    assert (mtu("eth0"), mtu("eth0.10")) == (9000, 9000)
    assert 'eth0_mtu="9000"\n' in INFO.read_text() and 'eth0.10_mtu="9000"\n' in INFO.read_text()
    assert addresses("eth0.10") == ["192.168.50.10/24"]
    partner_at("eth0.10", 9000)
    ping("-M", "do", "-s", "8972")

    run("ip", "link", "set", "eth0.10", "mtu", "1400")
    run("ip", "link", "set", "eth0", "mtu", "1500")
    run("/etc/rc.network", "restart", "eth0", "eth0.10")  # as the next boot does
    assert (mtu("eth0"), mtu("eth0.10")) == (9000, 9000)
    ping("-M", "do", "-s", "8972")

    assert remove() == 0, register()
    assert mtu("eth0") == 9000
    assert 'eth0_mtu="9000"\n' in INFO.read_text() and "eth0.10_mtu" not in INFO.read_text()


def test_a_refused_mtu_leaves_the_running_one_and_the_interfaces_up():
    assert create() == 0, register()
    assert library.KOVANetSetMTUValue(b"70000", b"eth0.10") == -1
    assert register() == (REFUSED, "net_set_mtu_eth")
    assert (mtu("eth0"), mtu("eth0.10")) == (1500, 1500)
    assert is_up("eth0") and is_up("eth0.10")
    assert ping_seen("eth0.10") == {10}
    # it stays configured, which the network script tells and lives with
    assert 'eth0_mtu="70000"\n' in INFO.read_text() and 'eth0.10_mtu="70000"\n' in INFO.read_text()
    told = run("/etc/rc.network", "restart", "eth0", "eth0.10", status=1).stderr
    assert 'eth0: cannot set the MTU "70000"' in told and 'eth0.10: cannot set the MTU "70000"' in told
    assert addresses("eth0.10") == ["192.168.50.10/24"]
    assert ping_seen("eth0.10") == {10}


def test_rules_follow_the_address(keep):
    keep("/etc/kova/firewall.conf").write_text("eth0 drop icmp\n")
    keep("/etc/kova/security.conf").write_text("eth0 syn 100\n")
    keep("/etc/kova/tc.conf").write_text("eth0 5000\n")
    run("/etc/rc.network", "start", "eth0")
    partner_at("eth0")
    assert run("ping", "-c", "2", "-W", "1", "192.168.50.1", status=None).returncode == 1

    assert create() == 0, register()
    assert pathlib.Path("/etc/kova/firewall.conf").read_text() == "eth0.10 drop icmp\n"
    assert pathlib.Path("/etc/kova/security.conf").read_text() == "eth0.10 syn 100\n"
    assert pathlib.Path("/etc/kova/tc.conf").read_text() == "eth0.10 5000\n"
    partner_at("eth0.10")
    assert run("ping", "-c", "2", "-W", "1", "192.168.50.1", status=None).returncode == 1
    on_vlan, on_row = (run("tc", "qdisc", "show", "dev", link).stdout for link in ("eth0.10", "eth0"))
    assert "rate 5Mbit" in on_vlan and "rate" not in on_row
    assert run("tc", "filter", "show", "dev", "eth0", "ingress").stdout == ""

    assert remove() == 0, register()
    assert pathlib.Path("/etc/kova/firewall.conf").read_text() == "eth0 drop icmp\n"
    partner_at("eth0")
    assert run("ping", "-c", "2", "-W", "1", "192.168.50.1", status=None).returncode == 1
    assert "rate 5Mbit" in run("tc", "qdisc", "show", "dev", "eth0").stdout
    pathlib.Path("/etc/kova/firewall.conf").write_text("")
    run("/usr/kova/bin/kovafirewall", "--start", "eth0")
    ping()
    pathlib.Path("/etc/kova/security.conf").write_text("")
    run("tc", "qdisc", "del", "dev", "eth0", "clsact")
    run("tc", "qdisc", "del", "dev", "eth0", "root")
