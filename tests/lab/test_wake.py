"""The frame that wakes a host, as the other end of the cable receives it."""

import ctypes

import pytest
from capture import captured
from conftest import KOVANET, NO, NO_PERMISSION, NOT_FOUND, complaint, kovanet, on_other_side, run, wait_for
from sdk import library, register

MAC = bytes.fromhex("001132abcdff")
FRAME = b"\xff" * 6 + b"\x08\x42" + b"\xff" * 6 + MAC * 16


@pytest.fixture(scope="module", autouse=True)
def cable():
    run("ip", "link", "set", "eth0", "up")
    on_other_side("ip", "link", "set", "eth0", "up")


class Wake(ctypes.Structure):
    _fields_ = [("abMac", ctypes.c_ubyte * 6), ("szIfname", ctypes.c_char * 16)]


def wake(ifname, mac=MAC):
    return library.KLIBNetEtherWake(ctypes.byref(Wake((ctypes.c_ubyte * 6)(*mac), ifname.encode())))


def woken(frames):
    """The frames that wake somebody: those that begin like one."""
    return [frame.content for frame in frames if frame.content[6:8] == b"\x08\x42"]


def test_the_frame_arrives_byte_for_byte():
    with captured("eth0") as frames:
        assert wake("eth0") == 0
        wait_for(lambda: woken(frames), what="the frame")
    assert woken(frames) == [FRAME]
    assert len(FRAME) == 110


def test_kovanet_sends_the_same_frame():
    with captured("eth0") as frames:
        for text in ("00:11:32:ab:cd:ff", "00-11-32-AB-CD-FF"):
            assert kovanet("wake", "eth0", text).stdout == ""
        wait_for(lambda: len(woken(frames)) == 2, what="the frames")
    assert woken(frames) == [FRAME] * 2


def test_kovanet_refuses_what_cannot_be_woken():
    for text in ("", "00:11:32:ab:cd", "00:11:32:ab:cd:f", "00:11:32:ab:cd:ff:", "0:011:32:ab:cd:ff",
                 "00:11:32:ab:cd:fg"):  # fmt: skip
        assert complaint("wake", "eth0", text, status=NO) == (
            f'hardware address "{text}" is not valid: it looks like 52:54:00:12:34:56')
    for text in ("00:00:00:00:00:00", "ff:ff:ff:ff:ff:ff", "01:00:5e:00:00:01"):
        assert "no single host has it" in complaint("wake", "eth0", text, status=NO)
    assert "loopback" in complaint("wake", "lo", "00:11:32:ab:cd:ff", status=NO)
    complaint("wake", "eth9", "00:11:32:ab:cd:ff", status=NOT_FOUND)


def test_an_interface_that_is_down_sends_nothing():
    run("ip", "link", "add", "wake0", "type", "veth", "peer", "name", "wake1")
    try:
        assert wake("wake0") == -1
        assert register() == (0x2A00, "net_ether_wake")
        assert complaint("wake", "wake0", "00:11:32:ab:cd:ff", status=NO) == (
            "wake0 is down; first: kovanet link up wake0")
    finally:
        run("ip", "link", "del", "wake0")


def test_only_root_can_wake():
    done = run("unshare", "--user", KOVANET, "wake", "eth0", "00:11:32:ab:cd:ff", status=NO_PERMISSION)
    assert done.stderr == "kovanet: waking a host needs root; run it as root or with sudo\n"
