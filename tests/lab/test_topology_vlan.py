# needs: bridge vlan
"""The interface with the appliance's address in each topology, when there are VLANs."""

import pytest
from conftest import data, run


@pytest.fixture(autouse=True)
def topology(keep):
    keep("/etc/kovainfo.conf").write_text('support_net_topology="yes"\nnet_topology="client"\n')


def interfaces():
    return [data("topology", "show", *words)["interface"] for words in ((), ("bridge",), ("router",))]


def test_vlan_has_the_address_of_its_interface():
    assert interfaces() == ["eth0", "br0", "eth0"]
    run("ip", "link", "add", "br0", "type", "bridge")
    try:
        run("ip", "link", "add", "link", "eth0", "name", "eth0.10", "type", "vlan", "id", "10")
        assert interfaces() == ["eth0.10", "br0", "eth0.10"]
        run("ip", "link", "add", "link", "br0", "name", "lan7", "type", "vlan", "id", "7")
        assert interfaces() == ["eth0.10", "lan7", "eth0.10"]
        run("ip", "link", "del", "eth0.10")
        assert interfaces() == ["eth0", "lan7", "eth0"]
    finally:
        run("ip", "link", "del", "eth0.10", status=None)
        run("ip", "link", "del", "br0")
    assert interfaces() == ["eth0", "br0", "eth0"]
