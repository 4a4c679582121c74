"""Addresses that another host has: the library and kovanet ask, a host on the other side answers."""

import ctypes

import pytest
from conftest import (CALL_FAILED, NO, NOT_FOUND, complaint, data, documented, kovanet, on_other_side, run, wait_for)
from sdk import library

OWN, TAKEN, FREE = "192.168.50.10", "192.168.50.77", "192.168.50.78"
OWN6, TAKEN6, FREE6 = "2001:db8:50::10", "2001:db8:50::77", "2001:db8:50::78"


@pytest.fixture(scope="module", autouse=True)
def other_host():
    """This machine, and a host that has an address of each family."""
    for side, address, address6 in ((run, OWN, OWN6), (on_other_side, TAKEN, TAKEN6)):
        side("ip", "link", "set", "eth0", "up")
        side("ip", "link", "set", "lo", "up")
        side("ip", "addr", "add", f"{address}/24", "dev", "eth0")
        side("ip", "addr", "add", f"{address6}/64", "dev", "eth0", "nodad")
    wait_for(lambda: run("ping", "-c", "1", "-W", "1", TAKEN6, status=None).returncode == 0, what="the other host")


@pytest.mark.parametrize(("address", "expected"), [(TAKEN, 1), (FREE, 0), (TAKEN6, 1), (FREE6, 0)])
def test_a_host_that_answers_is_a_conflict(address, expected):
    assert library.KOVAIIpConflict(b"eth0", address.encode()) == expected


def test_the_own_address_is_no_conflict_although_it_answers():
    run("ping", "-c", "1", "-w", "2", OWN)
    assert library.KOVAIIpConflict(b"eth0", OWN.encode()) == 0
    assert data("conflict", "address", "eth0", OWN)["conflict"] is False


def test_a_host_that_came_later_is_found():
    assert data("conflict", "address", "eth0", FREE)["conflict"] is False
    on_other_side("ip", "addr", "add", f"{FREE}/24", "dev", "eth0")
    try:
        # the kernel gives up a host that did not answer for some seconds
        wait_for(lambda: library.KOVAIIpConflict(b"eth0", FREE.encode()) == 1, what="the answer of the new host")
        assert data("conflict", "address", "eth0", FREE, status=NO)["conflict"] is True
    finally:
        on_other_side("ip", "addr", "del", f"{FREE}/24", "dev", "eth0")


def test_kovanet_answers_with_its_exit_code():
    told = data("conflict", "address", "eth0", TAKEN, status=NO)
    assert told == {"interface": "eth0", "address": TAKEN, "conflict": True}
    assert list(told) == documented("kovanet conflict address")
    assert kovanet("conflict", "address", "eth0", TAKEN, status=NO).stdout == f"another host has {TAKEN}\n"
    assert kovanet("conflict", "address", "eth0", FREE).stdout == f"no other host answers at {FREE}\n"


def test_kovanet_refuses_what_is_no_address_and_no_interface():
    assert complaint("conflict", "address", "eth0", "printer", status=NO) == (
        'address "printer" is not valid: it is no IPv4 or IPv6 address')
    assert "eth9" in complaint("conflict", "address", "eth9", FREE, status=NOT_FOUND)
    assert complaint("conflict", "bond", "eth0", status=NOT_FOUND).startswith("eth0 is no bond with members")


def test_a_tool_that_cannot_run_is_a_failure(tmp_path):
    run("mv", "/bin/ping", tmp_path)
    try:
        assert library.KOVAIIpConflict(b"eth0", FREE.encode()) == -1
        assert "NET_ERR_EXEC (0x2A00)" in complaint("conflict", "address", "eth0", FREE, status=CALL_FAILED)
    finally:
        run("mv", tmp_path / "ping", "/bin/ping")


def test_arguments_that_are_not_there_are_refused():
    for arguments in ((None, FREE.encode()), (b"eth0", None), (b"", b""), (b"eth0", b"-f")):
        assert library.KOVAIIpConflict(*map(ctypes.c_char_p, arguments)) == -1
