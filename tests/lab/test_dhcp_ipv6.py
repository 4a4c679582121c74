# box: --link eth0
"""What IPv6 hosts learn from the server in each of its modes: by the kernel, by a raw look at the advertisements, and by
a DHCP client."""

import ipaddress
import re
import socket
import struct

import pytest
from conftest import OTHER_SIDE, on_other_side, processes, run, wait_for
from dhcp_lab import FILES, SERVER, V6, bring_up, clean_server, dhclient, write
from sdk import dhcp_subnet, library

NETWORK = "2001:db8:60"
SERVERS = f"{NETWORK}::53", f"{NETWORK}::54"


@pytest.fixture(autouse=True)
def server():
    with clean_server("eth0"):
        yield


def serve_v6(mode, **fields):
    """The interface has a global address, and its other end forgets what it learned before."""
    bring_up("eth0", f"{NETWORK}::1/64")
    write("eth0", dhcp_subnet(enabled=1, v6_mode=mode, **{"lease_time": 3600, "dns1": SERVERS[0], "dns2": SERVERS[1],
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
