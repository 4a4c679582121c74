"""The topology: stored and described by the library and by kovanet."""

import pathlib

import pytest
from conftest import (
    CALL_FAILED, KOVANET, NO, NO_PERMISSION, USAGE, complaint, data, documented, keys_of, kovanet, run,
)  # fmt: skip
from sdk import TopologyInfo, library

INFO = pathlib.Path("/etc/kovainfo.conf")
TOPOLOGIES = {
    "client": ("eth0", True, [("eth0", "none", None), ("wlan0", "none", None)]),
    "bridge": ("br0", False, [("eth0", "slave", "br0"), ("wlan0", "slave", "br0"), ("br0", "master", "eth0")]),
    "router": ("eth0", False, [("eth0", "none", None), ("wlan0", "slave", "lbr0"), ("lbr0", "local-lan", "wlan0")]),
}


@pytest.fixture(autouse=True)
def supported(keep):
    keep(INFO).write_text('unique="test"\nsupport_net_topology="yes"\n')


def described(name, topology):
    ifname, client, parts = topology
    return {"supported": True, "topology": name, "interface": ifname, "client": client,
            "interfaces": [dict(zip(("name", "role", "peer"), part)) for part in parts]}  # fmt: skip


def test_topology_is_stored_and_described():
    for name, topology in TOPOLOGIES.items():
        kovanet("topology", "set", name)
        assert keys_of(INFO) == {"unique": '"test"', "support_net_topology": '"yes"', "net_topology": f'"{name}"'}
        told = data("topology", "show")
        assert told == described(name, topology)
        assert list(told) == documented("kovanet topology show")
        for other, its in TOPOLOGIES.items():
            assert data("topology", "show", other) == described(other, its)


def test_topology_that_is_not_stored_is_unknown():
    for line in ("", 'net_topology="mesh"\n'):
        INFO.write_text('support_net_topology="yes"\n' + line)
        assert data("topology", "show")["topology"] == "unknown"
    INFO.write_text('support_net_topology="yes"\nnet_topology="BRIDGE"\n')
    assert data("topology", "show")["topology"] == "bridge"


def test_table_shows_the_parts_of_the_interfaces():
    kovanet("topology", "set", "router")
    assert kovanet("topology", "show").stdout.splitlines() == [
        "topology:   router",
        "address on: eth0",
        "",
        "NAME   ROLE       PEER",
        "eth0   none       -",
        "wlan0  slave      lbr0",
        "lbr0   local-lan  wlan0",
    ]


def test_model_without_the_choice_has_none():
    for text in ("", 'support_net_topology="no"\nnet_topology="router"\n'):
        INFO.write_text(text)
        nothing = {"supported": False, "topology": None, "interface": None, "client": None, "interfaces": []}
        assert data("topology", "show") == data("topology", "show", "bridge") == nothing
        assert kovanet("topology", "show").stdout == "this model has no choice of topologies\n"
        assert complaint("topology", "set", "router", status=NO) == "this model has no choice of topologies"
        assert INFO.read_text() == text


def test_change_that_is_refused_leaves_the_file():
    before = INFO.read_bytes()
    for words in ((), ("mesh",), ("unknown",), ("Router",), ("",), ("router", "client")):
        complaint("topology", "set", *words, status=USAGE)
    complaint("topology", "show", "unknown", status=USAGE)
    user = ("setpriv", "--reuid=65534", "--regid=65534", "--clear-groups", KOVANET, "topology")
    assert run(*user, "set", "router", status=NO_PERMISSION).stderr.startswith("kovanet: ")
    run(*user, "show")
    assert INFO.read_bytes() == before


def test_file_that_cannot_be_written_is_told():
    run("mount", "--bind", INFO, INFO)
    try:
        before = INFO.read_bytes()
        assert "cannot store the topology router" in complaint("topology", "set", "router", status=CALL_FAILED)
        assert INFO.read_bytes() == before
    finally:
        run("umount", INFO)


def test_library_keeps_a_record_of_a_model_without_the_choice():
    INFO.write_text('net_topology="router"\n')
    info = TopologyInfo(nTopology=2, szName=b"mine")
    assert library.KLIBNetTopologyGet(info) == 0
    assert (info.nTopology, info.szName) == (2, b"mine")
