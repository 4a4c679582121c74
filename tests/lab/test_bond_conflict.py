# needs: bonding dummy
"""A bond and a member of it that are configured with the same address."""

import ctypes
import pathlib

import pytest
from conftest import NO, data, documented, kovanet, run
from sdk import library, register

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
MEMBERS = ("part0", "part1", "part2")
MADE = """
link add bond7 type bond mode active-backup miimon 50
link add part0 type dummy
link add part1 type dummy
link add part2 type dummy
link set part0 master bond7
link set part1 master bond7
link set part2 master bond7
link set bond7 up
"""


def configure(name, address):
    (SCRIPTS / f"ifcfg-{name}").write_text(f"DEVICE={name}\n" + (f"IPADDR={address}\n" if address else ""))


@pytest.fixture(autouse=True)
def bond():
    run("ip", "-batch", "-", input=MADE)
    configure("bond7", "10.7.0.1")
    configure("part0", "10.7.0.1")
    configure("part1", "")
    configure("part2", "10.7.0.2")
    yield
    for name in ("bond7", *MEMBERS):
        run("ip", "link", "del", name)
        (SCRIPTS / f"ifcfg-{name}").unlink(missing_ok=True)


def conflict():
    name = ctypes.create_string_buffer(16)
    return library.KOVANetBondIPConflict(b"bond7", name, len(name)), name.value.decode()


def test_the_member_with_the_bonds_address_is_named():
    assert conflict() == (0, "")
    configure("part2", "10.7.0.1")
    assert conflict() == (1, "part")


def test_a_member_without_a_file_is_a_failure():
    (SCRIPTS / "ifcfg-part1").unlink()
    assert conflict() == (-1, "")
    assert register()[0] == 0x900


def test_kovanet_tells_which_members_it_can_be():
    told = data("conflict", "bond", "bond7")
    assert told == {"bond": "bond7", "conflict": False, "members": []}
    assert list(told) == documented("kovanet conflict bond")
    assert kovanet("conflict", "bond", "bond7").stdout == "no other member of bond7 is configured with its address\n"
    configure("part1", "10.7.0.1")
    assert data("conflict", "bond", "bond7", status=NO)["members"] == ["part1", "part2"]
    assert kovanet("conflict", "bond", "bond7", status=NO).stdout == (
        "part1 or part2 is configured with the address of bond7\n")
