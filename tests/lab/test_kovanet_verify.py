# box: --link eth0 --link lan0
# needs: bridge tun
"""kovanet verify behind every kind of change that kovanet makes, and on a machine that has come away from its files."""

import os
import pathlib
import shutil
import socket

import pytest
from conftest import DhcpServer, kill, kovanet, on_other_side, processes, run, wait_for
from test_kovanet import NETWORK, interface_file, kernel_addresses
from test_tunnel import SECRET, SERVER, LabBroker
from verify_lab import differences, expect_agreement

DHCPD = pathlib.Path("/etc/dhcpd")
KOVAINFO = pathlib.Path("/etc/kovainfo.conf")
RESOLV = pathlib.Path("/etc/resolv.conf")
STATIC_ROUTES = pathlib.Path("/etc/iproute2/config/static-route4.conf")
RUN_KEYS = pathlib.Path("/etc/kova/service")
SWITCHES = pathlib.Path("/proc/sys/net/ipv6/conf/lan0")
KEPT = (KOVAINFO, NETWORK, RESOLV, RESOLV.with_suffix(".conf.static"), STATIC_ROUTES, "/etc/hostname", "/etc/hosts",
        RUN_KEYS / "kovatunnel.conf", RUN_KEYS / "ddns.conf", "/etc/sysconfig/network-scripts/ifcfg-tun",
        "/etc/gogoc/.tunnel_passwd")  # fmt: skip
SUBNET = ("subnet", "set", "lan0", "0", "range", "10.9.0.100", "10.9.0.110", "mask", "255.255.255.0", "router", "10.9.0.7")
SUBNET6 = ("subnet", "set", "lan0", "0", "6", "dns", "2001:db8:9::7", "mode")
ROUTER6 = "2001:db8:9::1"


def write_file(name, network):
    interface_file(name).write_text(f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=static\nIPADDR={network}.7\n"
                                    "NETMASK=255.255.255.0\n")  # fmt: skip


def wait_for_resolver():
    wait_for(lambda: not processes("/usr/kova/lib/resolver-update"), what="the end of the updates in the background")


@pytest.fixture(autouse=True)
def machine(keep):
    """Two cards with a fixed address, as a boot leaves them, and nothing else; so it is again afterwards."""
    for path in KEPT:
        keep(path)
    name = os.uname().nodename
    for card, network in (("eth0", "192.168.50"), ("lan0", "10.9.0")):
        on_other_side("ip", "addr", "replace", f"{network}.1/24", "dev", card)
        write_file(card, network)
    run("/etc/rc.network", "start", "eth0", "lan0")
    wait_for_resolver()
    yield
    shutil.rmtree(DHCPD, ignore_errors=True)
    run("/etc/rc.network", "nat-restart-dhcp")
    run("/etc/rc.network", "stop", status=None)
    for path in pathlib.Path("/etc/sysconfig/network-scripts").glob("ifcfg-*"):
        path.unlink()
    for switch, value in (("forwarding", "0"), ("disable_ipv6", "0"), ("accept_ra", "1")):
        (SWITCHES / switch).write_text(value)
    socket.sethostname(name)
    on_other_side("ip", "addr", "flush", "dev", "eth0", "scope", "global")


@pytest.fixture
def dhcp(tmp_path):
    with DhcpServer("lan0", "10.9.0", folder=tmp_path):
        yield


def server(*words):
    kovanet("dhcp-server", *words)


def switch(name, value):
    (SWITCHES / name).write_text(value)


def serve(*subnet):
    server(*subnet)
    server("enable", "lan0", "6" if "6" in subnet else "4")
    server("on")


# ---- behind a change ------------------------------------------------------------------------------------------------

# every command of a line behind the one before
CHANGES = {
    "card": ["card set lan0 static 10.9.0.8/24", "card set lan0 dhcp", "card set lan0 static 10.9.0.7/24"],
    "gateway": ["gateway set 10.9.0.1", "gateway set 192.168.50.1", "gateway clear"],
    "name servers": ["dns set 10.9.0.1 2001:db8:9::1", "dns set 10.9.0.1", "dns mode auto", "dns mode static"],
    "no name servers": ["dns mode static"],
    "host name": ["hostname set nas01", "hostname set nas01.example.com"],
    "MTU and block": ["mtu set lan0 1400 --yes", "block set lan0 ha on"],
    "IPv6 from the network": ["ipv6 set lan0 auto --yes", "ipv6 set lan0 auto_dhcp --yes", "ipv6 set lan0 off --yes",
                              "ipv6 set lan0 dhcp --yes", "ipv6 init"],
    "fixed IPv6 address": [f"ipv6 set lan0 static 2001:DB8:9:0::7/64 gateway {ROUTER6} --yes", "ipv6 init",
                           "ipv6 set lan0 static 2001:db8:9::8/64 --yes", "ipv6 set lan0 auto --yes"],
    "IPv6 router of the link": ["ipv6 set lan0 static 2001:db8:9::7/64 gateway FE80:0::1 --yes"],
    "DHCP server": [
        "dhcp-server on", f"dhcp-server {' '.join(SUBNET)}", "dhcp-server enable lan0",
        "dhcp-server subnet set lan0 0 range 10.9.0.120 10.9.0.130 lease 600", "dhcp-server subnet off lan0 0",
        "dhcp-server subnet set lan0 0", "dhcp-server disable lan0", "dhcp-server enable lan0",
        "dhcp-server pxe set remote 10.9.0.9 pxelinux.0", "dhcp-server vendor set MSFT 2 1i", "dhcp-server pxe off",
        "dhcp-server off", "dhcp-server restart"],
    "router advertisements": [
        f"dhcp-server {' '.join(SUBNET6)} ra-only", "dhcp-server enable lan0 6", "dhcp-server on",
        f"dhcp-server {' '.join(SUBNET6)} ra-stateless",
        f"dhcp-server {' '.join(SUBNET6)} stateful range 2001:db8:9::100 2001:db8:9::1ff", "dhcp-server off"],
}  # fmt: skip


@pytest.mark.parametrize("what", CHANGES)
def test_verify_agrees_behind_a_change(what):
    for words in CHANGES[what]:
        kovanet(*words.split(), timeout=120)
        expect_agreement()


def test_verify_agrees_with_a_lease(dhcp):
    kovanet("card", "set", "lan0", "dhcp")
    wait_for(lambda: kernel_addresses("lan0") not in ([], ["10.9.0.7/24"]), what="the lease")
    expect_agreement()
    [leased] = (address.partition("/")[0] for address in kernel_addresses("lan0"))
    run("ip", "addr", "flush", "dev", "lan0", "scope", "global")
    lease = "/etc/dhclient/ipv4/dhcpcd-lan0.info"
    assert differences() == [(lease, "IPADDR", leased, "none"), (lease, "NETMASK", "255.255.255.0", "none")]


def test_verify_agrees_with_a_bridge_that_is_started():
    kovanet("bridge", "set", "br0", "master", "lan0", "static", "10.9.0.7/24", "--yes")
    kovanet("bridge", "set", "lan0", "slave", "br0", "--yes")
    assert ("ifcfg-br0", "DEVICE", "br0", "none") in differences(), "its files are there, the bridge is not yet"
    run("/etc/rc.network", "start", "br0")
    expect_agreement()


def test_verify_agrees_with_a_tunnel_that_is_started_and_stopped(tmp_path):
    with LabBroker(tmp_path):
        kovanet("tunnel", "set", SERVER, "login", "alice", "--password-fd", "0", input=f"{SECRET}\n")
        kovanet("tunnel", "start", timeout=120)
        expect_agreement()
        kovanet("tunnel", "stop", timeout=120)
        expect_agreement()


def test_verify_agrees_for_those_who_are_not_root():
    kovanet("ipv6", "set", "lan0", "auto_dhcp", "--yes", timeout=60)
    serve(*SUBNET)
    nobody = ("setpriv", "--reuid", "65534", "--regid", "65534", "--clear-groups")
    assert run(*nobody, "/usr/bin/kovanet", "verify").stdout == kovanet("verify").stdout


# ---- away from the files --------------------------------------------------------------------------------------------


def test_host_name():
    socket.sethostname("other")
    assert differences() == [("/etc/hostname", "hostname", "appliance", "other")]


def test_name_servers():
    kovanet("dns", "set", "10.9.0.1", "10.9.0.2")
    wait_for_resolver()
    RESOLV.write_text("nameserver 10.9.0.2\n")
    assert differences() == [("/etc/resolv.conf.static", "nameserver", "10.9.0.1 10.9.0.2", "10.9.0.2")]


def test_static_routes():
    STATIC_ROUTES.write_text("# as the administrator has them\n\n10.20.0.0/16 10.9.0.1 lan0\n10.21.0.0/24 10.9.0.1 lan0\n")
    run("/usr/kova/sbin/kovanetdtool", "--refresh-static-route-rules", "-4")
    expect_agreement()
    run("ip", "route", "del", "10.20.0.0/16")
    run("ip", "route", "replace", "10.21.0.0/24", "via", "192.168.50.1")
    assert differences() == [(str(STATIC_ROUTES), "10.20.0.0/16", "10.9.0.1 lan0", "none"),
                             (str(STATIC_ROUTES), "10.21.0.0/24", "10.9.0.1 lan0", "192.168.50.1 eth0")]


def test_dhcp_client_that_is_not_there():
    kovanet("card", "set", "lan0", "dhcp")
    kill(wait_for(lambda: processes("dhclient -4"), what="the client"))
    assert differences() == [("ifcfg-lan0", "BOOTPROTO", "dhcp", "no client")]


def test_dhcp_client_that_is_not_wanted():
    kovanet("card", "set", "lan0", "dhcp")
    write_file("lan0", "10.9.0")
    assert ("ifcfg-lan0", "BOOTPROTO", "static", "dhcp") in differences()


@pytest.fixture
def fixed_ipv6():
    kovanet("ipv6", "set", "lan0", "static", "2001:db8:9::7/64", "gateway", ROUTER6, "--yes", timeout=60)
    expect_agreement()


def test_ipv6_router(fixed_ipv6):
    run("ip", "-6", "route", "del", "default", "dev", "lan0")
    assert differences() == [("ifcfg-lan0", "IPV6_DEFAULTGW", ROUTER6, "none")]
    run("ip", "-6", "route", "add", "default", "via", "fe80::77", "dev", "lan0")
    assert differences() == [("ifcfg-lan0", "IPV6_DEFAULTGW", ROUTER6, "fe80::77")]


def test_ipv6_prefix_length(fixed_ipv6):
    run("ip", "addr", "del", "2001:db8:9::7/64", "dev", "lan0")
    run("ip", "addr", "add", "2001:db8:9::7/60", "dev", "lan0", "nodad")
    assert ("ifcfg-lan0", "IPV6ADDR", "2001:db8:9::7/64", "2001:db8:9::7/60") in differences()


def test_router_advertisements(fixed_ipv6):
    switch("accept_ra", "2")
    assert differences() == [("ifcfg-lan0", "IPV6_ACCEPT_RA", "0", "1")]


def test_router_advertisements_of_a_machine_that_forwards():
    kovanet("ipv6", "set", "lan0", "auto", "--yes", timeout=60)
    switch("forwarding", "1")
    expect_agreement()
    switch("accept_ra", "1")
    assert differences() == [("ifcfg-lan0", "IPV6_ACCEPT_RA", "1", "0")]


def test_ipv6_that_is_off():
    kovanet("ipv6", "set", "lan0", "auto", "--yes", timeout=60)
    switch("disable_ipv6", "1")
    assert differences() == [("ifcfg-lan0", "IPV6INIT", "auto", "off")]


def test_ipv6_that_is_on():
    kovanet("ipv6", "set", "lan0", "off", "--yes", timeout=60)
    switch("disable_ipv6", "0")
    assert differences() == [("ifcfg-lan0", "IPV6INIT", "off", "on")]


def test_listener_for_name_servers():
    kovanet("ipv6", "set", "lan0", "auto", "--yes", timeout=60)
    run("/sbin/stop", "ra-dns", "IFACE=lan0")
    assert differences() == [("ifcfg-lan0", "IPV6INIT", "auto", "no listener for name servers")]


@pytest.mark.parametrize("mode,kind", [("dhcp", "client"), ("auto_dhcp", "info")])
def test_dhcpv6_client(mode, kind):
    kovanet("ipv6", "set", "lan0", mode, "--yes", timeout=60)
    run("/sbin/stop", "dhcp-client6", "IFACE=lan0", f"ACTION={kind}")
    assert differences() == [("ifcfg-lan0", "IPV6INIT", mode, "no client")]
    other = {"client": "info", "info": "client"}[kind]
    run("/sbin/start", "dhcp-client6", "IFACE=lan0", f"ACTION={other}")
    assert differences() == [("ifcfg-lan0", "IPV6INIT", mode, {"client": "dhcp", "info": "auto_dhcp"}[other])]


def test_dhcp_server_that_died():
    serve(*SUBNET)
    kill(processes("dnsmasq --conf-file=/run/kova/dhcp-server/dnsmasq.conf"))
    assert differences() == [(f"{DHCPD}/dhcpd.info", "enable", "yes", "no server")]


def test_dhcp_server_that_does_not_know_its_files_yet():
    serve(*SUBNET)
    server("subnet", "set", "lan0", "0", "range", "10.9.0.120", "10.9.0.130", "--no-restart")
    [(file, key, wanted, actual)] = differences()
    assert (file, key) == (f"{DHCPD}/dhcpd-lan0-subnet0.conf", "dhcp-range")
    assert ",10.9.0.120,10.9.0.130," in wanted and ",10.9.0.100,10.9.0.110," in actual

    server("subnet", "off", "lan0", "0", "--no-restart")
    assert differences() == [(f"{DHCPD}/dhcpd-lan0-subnet0.info", "enable", "no", "yes")]
    server("disable", "lan0", "--no-restart")
    assert differences() == [(f"{DHCPD}/dhcpd-lan0.info", "enable", "no", "yes")]
    server("off", "--no-restart")
    assert differences() == [(f"{DHCPD}/dhcpd.info", "enable", "no", "yes")]
    server("restart")
    expect_agreement()


def test_subnet_that_the_server_was_not_started_with():
    serve(*SUBNET)
    server(*SUBNET6, "ra-only", "--no-restart")
    server("enable", "lan0", "6", "--no-restart")
    server("pxe", "set", "remote", "10.9.0.9", "pxelinux.0", "--no-restart")
    assert differences() == [(f"{DHCPD}/dhcpd6-lan0-subnet0.info", "enable", "yes", "no"),
                             (f"{DHCPD}/dhcpd-pxe.info", "enable", "yes", "no")]


def test_server_on_an_interface_that_is_down():
    serve(*SUBNET)
    run("ip", "link", "set", "lan0", "down")
    assert (f"{DHCPD}/dhcpd-lan0-subnet0.info", "enable", "yes", "lan0 is not up") in differences()


def test_tunnel_that_is_not_there():
    (RUN_KEYS / "kovatunnel.conf").write_text("run=yes\n")
    assert differences() == [(f"{RUN_KEYS}/kovatunnel.conf", "run", "yes", "no")]


def test_tunnel_that_is_not_wanted(tmp_path):
    with LabBroker(tmp_path):
        kovanet("tunnel", "set", SERVER, "anonymous")
        kovanet("tunnel", "start", timeout=120)
        (RUN_KEYS / "kovatunnel.conf").write_text("run=no\n")
        assert differences() == [(f"{RUN_KEYS}/kovatunnel.conf", "run", "no", "yes")]
        kovanet("tunnel", "stop", timeout=120)


def test_service_with_a_run_key():
    (RUN_KEYS / "ddns.conf").write_text("run=yes\n")
    assert differences() == [(f"{RUN_KEYS}/ddns.conf", "run", "yes", "no")]
    run("/sbin/start", "ddns")
    try:
        wait_for(lambda: run("/usr/bin/kovanet", "verify", status=None).returncode == 0, what="the service")
    finally:
        run("/sbin/stop", "ddns")
