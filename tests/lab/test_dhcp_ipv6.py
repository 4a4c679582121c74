# box: --link eth0
"""What IPv6 hosts learn from the server in each of its modes: by the kernel, by a raw look at the advertisements, and
by a DHCP client."""

import ipaddress
import re
import struct

import pytest
from conftest import on_other_side, processes, wait_for
from dhcp_lab import FILES, SERVER, V6, bring_up, clean_server, dhclient, serve, served_lines, udhcpc, write
from sdk import dhcp_subnet, library

NETWORK = "2001:db8:60"
NAME_SERVERS = [f"{NETWORK}::53", f"{NETWORK}::54"]
MANAGED, OTHER = 0x80, 0x40  # of the advertisement
ON_LINK, AUTONOMOUS = 0x80, 0x40  # of a prefix in it
PREFIX, RDNSS = 3, 25  # options of it
RANGE = {"start_ip": f"{NETWORK}::10", "end_ip": f"{NETWORK}::20"}

# asks until a router answers, and prints the answer
ASK_ROUTERS = """
import socket, sys
asker = socket.socket(socket.AF_INET6, socket.SOCK_RAW, socket.IPPROTO_ICMPV6)
asker.setsockopt(socket.IPPROTO_IPV6, socket.IPV6_MULTICAST_HOPS, 255)
asker.settimeout(1)
for _ in range(20):
    asker.sendto(bytes([133, 0, 0, 0, 0, 0, 0, 0]), ("ff02::2", 0, 0, socket.if_nametoindex(sys.argv[1])))
    try:
        answer = asker.recv(4096)
        while answer[0] != 134:
            answer = asker.recv(4096)
    except OSError:
        continue
    print(answer.hex())
    break
"""


@pytest.fixture(autouse=True)
def server():
    with clean_server("eth0"):
        yield


def serve_v6(mode, **fields):
    """The interface has a global address, and its other end forgets what it learned before."""
    bring_up("eth0", f"{NETWORK}::1/64")
    write("eth0", dhcp_subnet(enabled=1, v6_mode=mode, **{"lease_time": 3600, "dns1": NAME_SERVERS[0],
                                                          "dns2": NAME_SERVERS[1],
                                                          **fields}), family=V6)  # fmt: skip
    assert library.DHCPServerRestart() == 0


def learned_addresses():
    """Global addresses of the other end: what the kernel made of the advertisements."""
    shown = on_other_side("ip", "-6", "addr", "show", "dev", "eth0", "scope", "global").stdout
    return re.findall(r"inet6 (\S+)/64 .*dynamic", shown)


def ask_routers_anew():
    """The kernel asks when an interface comes up."""
    for state in ("down", "up"):
        on_other_side("ip", "link", "set", "eth0", state)


def advertisement():
    """What the server advertises to one who asks: flags, the router's lifetime, and the options' contents by type."""
    answer = bytes.fromhex(on_other_side("/usr/bin/python3", "-c", ASK_ROUTERS, "eth0").stdout)
    flags, lifetime = struct.unpack_from(">BH", answer, 5)
    options, rest = {}, answer[16:]
    while rest:
        length = rest[1] * 8
        options.setdefault(rest[0], []).append(rest[2:length])
        rest = rest[length:]
    return flags, lifetime, options


def prefix_in(options):
    """Network, flags, and how long addresses in it live."""
    [content] = options[PREFIX]
    length, flags, valid = struct.unpack_from(">BBL", content)
    return f"{ipaddress.IPv6Address(content[14:30])}/{length}", flags, valid


def name_servers_in(options):
    [content] = options[RDNSS]
    return [str(ipaddress.IPv6Address(content[at : at + 16])) for at in range(6, len(content), 16)]


def assert_hosts_make_addresses():
    ask_routers_anew()
    [learned] = wait_for(learned_addresses, what="an address by router advertisement")
    assert ipaddress.IPv6Address(learned) in ipaddress.IPv6Network(f"{NETWORK}::/64")


def test_ra_only_gives_prefix_and_name_servers():
    serve_v6("ra-only")
    assert_hosts_make_addresses()
    flags, lifetime, options = advertisement()
    assert flags & (MANAGED | OTHER) == 0
    assert lifetime > 0
    assert prefix_in(options) == (f"{NETWORK}::/64", ON_LINK | AUTONOMOUS, 3600)
    assert name_servers_in(options) == NAME_SERVERS


def test_ra_stateless_gives_prefix_and_answers_who_asks_for_name_servers(tmp_path):
    serve_v6("ra-stateless", lease_time=1800, dns_more=f"[{NETWORK}::55],[{NETWORK}::56]")
    servers = [*NAME_SERVERS, f"{NETWORK}::55", f"{NETWORK}::56"]
    assert_hosts_make_addresses()
    flags, _, options = advertisement()
    assert flags & (MANAGED | OTHER) == OTHER
    assert prefix_in(options) == (f"{NETWORK}::/64", ON_LINK | AUTONOMOUS, 1800)
    assert name_servers_in(options) == servers
    told = dhclient("eth0", tmp_path, family="-6", flags=["-S"], request=["dhcp6.name-servers"])
    assert told["dhcp6_name_servers"].split() == servers
    assert "ip6_address" not in told


def test_stateful_leases_addresses_of_the_range(tmp_path):
    serve_v6("stateful", **RANGE)
    flags, lifetime, options = advertisement()
    assert flags & (MANAGED | OTHER) == MANAGED | OTHER
    assert lifetime > 0
    assert prefix_in(options) == (f"{NETWORK}::/64", ON_LINK, 3600)
    assert name_servers_in(options) == NAME_SERVERS
    told = dhclient("eth0", tmp_path, family="-6", request=["dhcp6.name-servers"])
    assert 0x10 <= int(ipaddress.IPv6Address(told["ip6_address"])) & 0xFFFF <= 0x20
    assert ipaddress.IPv6Address(told["ip6_address"]) in ipaddress.IPv6Network(f"{NETWORK}::/64")
    assert told["dhcp6_name_servers"].split() == NAME_SERVERS
    assert (told["max_life"], told["renew"]) == ("3600", "1800")
    assert learned_addresses() == []


def test_stateful_range_is_the_one_that_was_written(tmp_path):
    serve_v6("stateful", start_ip=f"{NETWORK}::abcd", end_ip=f"{NETWORK}::abcd", lease_time=900)
    told = dhclient("eth0", tmp_path, family="-6")
    assert (told["ip6_address"], told["max_life"]) == (f"{NETWORK}::abcd", "900")


@pytest.mark.parametrize("mode", ["ra-only", "ra-stateless", "stateful"])
def test_without_name_servers_none_are_advertised(mode):
    serve_v6(mode, dns1="", dns2="", **(RANGE if mode == "stateful" else {}))
    _, _, options = advertisement()
    assert prefix_in(options)[0] == f"{NETWORK}::/64"
    assert RDNSS not in options


def test_mode_off_leaves_the_subnet_as_it_was_and_the_switch_ends_it():
    serve_v6("ra-only")
    write("eth0", dhcp_subnet(enabled=1, v6_mode="off"), family=V6)
    assert library.DHCPServerRestart() == 0
    assert prefix_in(advertisement()[2])[0] == f"{NETWORK}::/64"
    write("eth0", dhcp_subnet(enabled=0, v6_mode="off"), family=V6)
    assert library.DHCPServerRestart() == 0
    assert not processes(SERVER)
    assert (FILES / "dhcpd6-eth0-subnet0.conf").exists()


def test_interface_is_switched_for_one_family_alone(tmp_path):
    serve_v6("ra-stateless")
    serve("eth0", "192.168.60")
    assert library.DHCPServerRestart() == 0
    assert udhcpc("eth0", tmp_path)["router"] == "192.168.60.1"
    assert prefix_in(advertisement()[2])[0] == f"{NETWORK}::/64"
    assert library.DHCPInterfaceSetEnabled(b"eth0", V6, 0) == 0
    assert library.DHCPServerRestart() == 0
    assert not [line for line in served_lines() if NETWORK in line or "constructor" in line]
    assert udhcpc("eth0", tmp_path)["router"] == "192.168.60.1"
