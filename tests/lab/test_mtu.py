"""The MTU: stored, set in a kernel that takes the interface down for it, and what that costs."""

import pathlib

import pytest
from conftest import DhcpServer, addresses, is_up, on_other_side, routes, run, wait_for
from sdk import library, register

ETH0 = pathlib.Path("/etc/sysconfig/network-scripts/ifcfg-eth0")
INFO = pathlib.Path("/etc/kovainfo.conf")
MTU = pathlib.Path("/sys/class/net/eth0/mtu")
REFUSED = 0x8100


@pytest.fixture(autouse=True)
def wired(keep):
    for path in (ETH0, INFO, "/etc/sysconfig/network", "/etc/iproute2/config/static-route4.conf"):
        keep(path)
    on_other_side("ip", "link", "set", "eth0", "mtu", "9000")
    on_other_side("ip", "addr", "replace", "192.168.50.1/24", "dev", "eth0")
    yield
    run("/etc/rc.network", "stop", "eth0")
    on_other_side("ip", "addr", "flush", "dev", "eth0")
    run("ip", "link", "set", "eth0", "mtu", "1500")


def static_eth0():
    ETH0.write_text("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=static\nIPADDR=192.168.50.10\nNETMASK=255.255.255.0\n"
                    "IPV6INIT=static\nIPV6ADDR=2001:db8:50::5\nIPV6PREFIXLENG=64\n")  # fmt: skip
    pathlib.Path("/etc/sysconfig/network").write_text("GATEWAY=192.168.50.1\n")
    pathlib.Path("/etc/iproute2/config/static-route4.conf").write_text("10.20.0.0/16 192.168.50.254 eth0\n")
    run("/etc/rc.network", "start", "eth0")


def state():
    """Addresses and routes of eth0; what is link-local comes and goes."""
    ipv6 = run("ip", "-6", "-o", "addr", "show", "dev", "eth0", "scope", "global").stdout.split()
    return addresses("eth0"), sorted(routes()), [word for word in ipv6 if "/" in word]


def test_a_jumbo_mtu_costs_no_address_and_no_route():
    static_eth0()
    before = state()
    assert "default via 192.168.50.1 dev eth0" in before[1] and before[2] == ["2001:db8:50::5/64"]
    assert library.KOVANetSetMTUValue(b"9000", b"eth0") == 0, register()
    assert MTU.read_text() == "9000\n" and 'eth0_mtu="9000"\n' in INFO.read_text()
    assert state() == before
    run("ping", "-c", "1", "-W", "5", "-M", "do", "-s", "8972", "192.168.50.1")


def test_a_refused_mtu_is_stored_and_the_next_start_repairs_what_it_cost():
    static_eth0()
    before = state()
    assert library.KOVANetSetMTUValue(b"70000", b"eth0") == -1
    assert register() == (REFUSED, "net_set_mtu_eth")
    assert MTU.read_text() == "1500\n" and 'eth0_mtu="70000"\n' in INFO.read_text()
    assert is_up("eth0") and addresses("eth0") == before[0]
    run("ping", "-c", "1", "-W", "5", "192.168.50.1")
    run("/etc/rc.network", "start", "eth0", status=1)
    assert state() == before


def test_a_leased_default_route_lasts(tmp_path):
    with DhcpServer("eth0", "192.168.50", "--dhcp-option=option:router,192.168.50.1", folder=tmp_path):
        ETH0.write_text("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=dhcp\n")
        run("/etc/rc.network", "start", "eth0")
        wait_for(lambda: routes("default") == ["default via 192.168.50.1 dev eth0"], what="the leased route")
        before = state()
        assert library.KOVANetSetMTUValue(b"9000", b"eth0") == 0, register()
        assert MTU.read_text() == "9000\n" and state() == before
        run("/etc/rc.network", "stop", "eth0")
