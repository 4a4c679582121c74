"""Names: a name server that knows them, one that never answers, and a host of the local network that answers to its
NetBIOS name."""

import contextlib
import ctypes
import pathlib
import socket

import pytest
from capture import socket_on_other_side
from conftest import (CALL_FAILED, KOVANET, NO, NOT_FOUND, OTHER_SIDE, Daemon, complaint, data, documented,
                      on_other_side, run, wait_for)
from sdk import library

SERVER = "192.168.50.1"
RESOLV = pathlib.Path("/etc/resolv.conf")
NMBD = pathlib.Path(__file__).resolve().parents[2] / "build" / "samba" / "nmbd"
NMBLOOKUP = "/usr/bin/nmblookup"
MANY = {f"many.example,10.9.{i // 200}.{i % 200 + 1}" for i in range(40)}
SETTINGS = """[global]
netbios name = NAS77
workgroup = LAB
interfaces = eth0
bind interfaces only = yes
lock directory = {folder}
state directory = {folder}
cache directory = {folder}
pid directory = {folder}
private dir = {folder}
log file = {folder}/log
"""


class Found(ctypes.Structure):
    _fields_ = [("szIP", ctypes.c_char * 46), ("nFamily", ctypes.c_int32)]


def look_up(name, room=16, count_all=0):
    """What the library answers, and the addresses it stores with their families."""
    records = (Found * room)()
    count = library.KOVANetLookupIP(name.encode(), records, room, count_all)
    return count, [(record.szIP.decode(), record.nFamily) for record in records if record.nFamily]


@pytest.fixture(scope="module", autouse=True)
def network():
    run("ip", "addr", "add", "192.168.50.10/24", "dev", "eth0")
    on_other_side("ip", "addr", "add", f"{SERVER}/24", "dev", "eth0")
    for side in (run, on_other_side):
        side("ip", "link", "set", "eth0", "up")
        side("ip", "link", "set", "lo", "up")


@pytest.fixture
def asked(keep):
    """The name server on the other side is the one that is asked, once and for a second."""
    keep(RESOLV).write_text(f"nameserver {SERVER}\noptions timeout:1 attempts:1\n")


class NameServer(Daemon):
    """dnsmasq on the other side, which knows some names of the domain example."""

    def __init__(self, folder):
        self.log = folder / "names.log"
        records = {"both.example,10.9.1.1,2001:db8:9::1", "four.example,10.9.1.2", "six.example,2001:db8:9::3", *MANY}
        command = [*OTHER_SIDE, "dnsmasq", "--no-daemon", "--conf-file=/dev/null", "--no-resolv", "--no-hosts",
                   f"--listen-address={SERVER}", "--bind-interfaces", "--local=/#/", "--user=root", "--group=root",
                   *(f"--host-record={record}" for record in records), f"--log-facility={self.log}",
                   f"--pid-file={self.log}.pid"]  # fmt: skip
        super().__init__(command, lambda: self.log.exists() and "started, version" in self.log.read_text())


@pytest.fixture
def names(asked, tmp_path):
    RESOLV.write_text(f"nameserver {SERVER}\noptions timeout:30\n")  # it answers, but on a busy machine maybe late
    with NameServer(tmp_path):
        yield


@pytest.fixture(scope="module")
def netbios(tmp_path_factory):
    """A host on the other side whose NetBIOS name is NAS77."""
    if not NMBD.exists():
        pytest.skip("lab/prepare found no package with nmbd, and says why")
    folder = tmp_path_factory.mktemp("samba")
    settings = folder / "smb.conf"
    settings.write_text(SETTINGS.format(folder=folder))
    pathlib.Path("/run/samba").mkdir(exist_ok=True)
    command = [*OTHER_SIDE, NMBD, "--foreground", "--no-process-group", f"--configfile={settings}"]
    with Daemon(command, lambda: SERVER in run(NMBLOOKUP, "nas77", status=None).stdout):
        yield


def assert_found_on_the_network(name):
    """The tool asks for a fraction of a second, within which a host on a busy machine may not answer."""
    assert wait_for(lambda: look_up(name)[1], what=f"an answer of {name}") == [(SERVER, 2)]


@contextlib.contextmanager
def in_place_of_the_tool(lines, folder):
    """A script in the place of nmblookup, which goes to the folder meanwhile."""
    run("mv", NMBLOOKUP, folder)
    pathlib.Path(NMBLOOKUP).write_text(f"#!/bin/sh\n{lines}\n")
    pathlib.Path(NMBLOOKUP).chmod(0o755)
    try:
        yield
    finally:
        run("mv", folder / "nmblookup", NMBLOOKUP)


# ---- the resolver ---------------------------------------------------------------------------------------------------


def test_names_have_addresses_of_one_family_or_both(names):
    assert look_up("four.example") == (1, [("10.9.1.2", 2)])
    assert look_up("six.example") == (1, [("2001:db8:9::3", 10)])
    count, found = look_up("both.example")
    assert (count, sorted(found)) == (2, [("10.9.1.1", 2), ("2001:db8:9::1", 10)])


def test_an_address_is_its_own_name():
    assert look_up("192.0.2.1") == (1, [("192.0.2.1", 2)])
    assert look_up("2001:DB8:0::1") == (1, [("2001:db8::1", 10)])


def test_more_addresses_than_there_is_room_for_are_counted_when_asked_for(names):
    count, found = look_up("many.example", room=3)
    assert (count, len(found)) == (3, 3)
    count, found = look_up("many.example", room=3, count_all=1)
    assert (count, len(found)) == (40, 3)
    assert len(data("lookup", "many.example")) == 40


def test_a_dotted_name_that_nobody_knows_is_not_asked_for_on_the_network(names, tmp_path):
    noted = tmp_path / "noted"
    with in_place_of_the_tool(f'echo "$*" >>{noted}', tmp_path):
        assert look_up("none.example") == (0, [])
        assert not noted.exists()
        assert look_up("none") == (0, [])
        assert noted.read_text() == "none\n"


def test_a_name_server_that_never_answers_ends_the_lookup(asked, netbios):
    with socket_on_other_side(socket.AF_INET, socket.SOCK_DGRAM) as silent:
        silent.bind((SERVER, 53))
        assert look_up("four.example") == (0, [])
        assert_found_on_the_network("nas77")
        silent.settimeout(5)
        assert b"\x04four\x07example" in silent.recv(512)


# ---- the local network ----------------------------------------------------------------------------------------------


def test_a_bare_name_is_asked_for_on_the_network(names, netbios):
    assert_found_on_the_network("nas77")
    assert_found_on_the_network("NAS77")
    assert look_up("nas78") == (0, [])
    wait_for(lambda: look_up("nas77", room=0, count_all=1) == (1, []), what="the count of its addresses")


def test_output_without_an_end_ends_the_lookup(names, tmp_path):
    for endless in ("cat /dev/zero", "yes other", "tr '\\0' x </dev/zero"):
        with in_place_of_the_tool(f"echo '10.9.1.9 nas77<00>'\nexec {endless}", tmp_path):
            assert look_up("nas77") == (1, [("10.9.1.9", 2)])


# ---- kovanet --------------------------------------------------------------------------------------------------------


def test_kovanet_shows_the_addresses(names, netbios):
    told = data("lookup", "both.example")
    assert sorted(told, key=str) == [{"address": "10.9.1.1", "family": 4}, {"address": "2001:db8:9::1", "family": 6}]
    assert list(told[0]) == documented("kovanet lookup")
    shown = wait_for(lambda: run(KOVANET, "lookup", "nas77", status=None).stdout, what="an answer of nas77")
    assert [line.split() for line in shown.splitlines()] == [["ADDRESS", "FAMILY"], [SERVER, "IPv4"]]


def test_kovanet_tells_that_there_is_none(names):
    assert complaint("lookup", "none.example", status=NOT_FOUND) == "no address of none.example is known"
    assert complaint("lookup", "", status=NO) == "the name is empty"


def test_a_tool_that_is_not_there_is_a_failure(names, tmp_path):
    run("mv", NMBLOOKUP, tmp_path)
    try:
        assert look_up("nas78") == (0, [])
        assert "NET_ERR_EXEC (0x2A00)" in complaint("lookup", "nas78", status=CALL_FAILED)
    finally:
        run("mv", tmp_path / "nmblookup", NMBLOOKUP)
