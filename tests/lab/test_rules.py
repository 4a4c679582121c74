# box: --link eth0 --link lan0
# needs: flower tbf
"""Firewall and traffic control by interface: what they let through, and that their rules follow a new name."""

import pathlib
import re
import socket
import time

import pytest
from capture import in_order, socket_on_other_side
from conftest import on_other_side, run, wait_for

FIREWALL, SHAPER = "/usr/kova/bin/kovafirewall", "/usr/kova/bin/tctool"
RULES, LIMITS, RATES = (pathlib.Path(f"/etc/kova/{name}.conf") for name in ("firewall", "security", "tc"))
CHANGES = {RULES: (FIREWALL, "--change-adapter"), LIMITS: (FIREWALL, "--change-security-adapter"),
           RATES: (SHAPER, "-change_interface")}  # fmt: skip
PARTNER, OWN = "192.168.77.1", "192.168.77.5"


@pytest.fixture(autouse=True)
def wired(keep):
    """eth0 and its other side with an address each; no rules."""
    for path in CHANGES:
        keep(path)
    on_other_side("ip", "addr", "replace", f"{PARTNER}/24", "dev", "eth0")
    run("ip", "-batch", "-", input=f"link set eth0 up\nlink set lan0 up\naddr replace {OWN}/24 dev eth0\n")
    yield
    for path in CHANGES:
        path.write_text("")
    for link in ("eth0", "lan0"):
        run("tc", "qdisc", "del", "dev", link, "clsact", status=None)
        run("tc", "qdisc", "del", "dev", link, "root", status=None)


def load(link="eth0", status=0):
    return run(FIREWALL, "--start", link, status=status).stderr


def filters(link):
    return run("tc", "filter", "show", "dev", link, "ingress").stdout


def ports_reached(*ports, kind=socket.SOCK_DGRAM):
    """Of some UDP ports, those on which a datagram from the other side arrives. The last one has to."""
    listening = {}
    try:
        for port in ports:
            listening[port] = socket.socket(socket.AF_INET, kind)
            listening[port].bind((OWN, port))
            listening[port].setblocking(False)
        with socket_on_other_side(socket.AF_INET, kind) as sender, in_order():
            for port in ports:
                sender.sendto(b"x", (OWN, port))
        wait_for(lambda: arrived(listening[ports[-1]]), what="the last datagram")
        return [port for port in ports[:-1] if arrived(listening[port])] + [ports[-1]]
    finally:
        for each in listening.values():
            each.close()


def arrived(receiver):
    try:
        return bool(receiver.recv(1))
    except BlockingIOError:
        return False


def test_the_first_rule_that_fits_decides():
    assert ports_reached(7001, 7002, 7003, 7009) == [7001, 7002, 7003, 7009]
    RULES.write_text("# what comes in\neth0 accept udp 7001\n\neth0 drop udp 7001 192.168.77.0/24\n"
                     "eth0 drop udp 7002 192.168.77.0/24\neth0 drop udp 7003 10.0.0.0/8\neth0 drop tcp\n")  # fmt: skip
    assert load() == ""
    assert ports_reached(7001, 7002, 7003, 7009) == [7001, 7003, 7009]
    RULES.write_text("eth0 accept udp 7009\neth0 drop any\n")
    for _ in range(2):
        assert load() == ""
        assert ports_reached(7001, 7002, 7003, 7009) == [7009]
    RULES.write_text("lan0 drop any\n")
    LIMITS.write_text("lan0 ping 5\n")
    assert load() == ""
    assert ports_reached(7001, 7002, 7003, 7009) == [7001, 7002, 7003, 7009]


def test_only_so_many_echo_requests_a_second_are_answered():
    LIMITS.write_text("eth0 ping 5\neth0 syn 100\n")
    load()
    # a hundred at once, then as many as are let through; a slow machine that spread the first would have all answered
    answers = on_other_side("ping", "-c", "110", "-l", "100", "-i", "0.2", "-W", "1", OWN, status=None).stdout
    assert 1 <= int(re.search(r"(\d+) received", answers)[1]) < 100
    assert ports_reached(7001, 7009) == [7001, 7009]


@pytest.mark.parametrize(
    "line",
    ["eth0", "eth0 drop", "eth0 reject tcp", "eth0 drop sctp", "eth0 drop tcp x", "eth0 drop tcp 22 10.0.0.1",
     "eth0 drop tcp 22 10.0.0.1/33", "eth0 drop tcp 22 10.0.0.0/8 more", "eth0 drop icmp 8", "eth0 drop udp $(reboot)",
     "eth0 drop tcp 22 10.0.0.0/8/9"],
)  # fmt: skip
def test_what_is_no_rule_is_left_out_and_told(line, system_log):
    RULES.write_text(f"{line}\neth0 drop udp 7001\n")
    assert f"{RULES}: left out, no rule: {line}" in load()
    assert ports_reached(7001, 7009) == [7009]
    wait_for(lambda: system_log.holds("left out, no rule"), what="the message in the system log")


@pytest.mark.parametrize("line", ["eth0 ping", "eth0 ping 0", "eth0 ping x", "eth0 ping -1", "eth0 fin 5", "eth0 syn 5 5"])
def test_what_is_no_limit_is_left_out_and_told(line):
    LIMITS.write_text(f"{line}\neth0 syn 7\n")
    assert f"{LIMITS}: left out, no rule: {line}" in load()
    assert "pkts_rate 7" in filters("eth0")


def test_what_the_kernel_does_not_take_is_told_and_the_others_are_in_force():
    RULES.write_text("eth0 drop udp 99999\neth0 drop udp 7001\n")
    assert "eth0: not all rules are in force: " in load(status=1)
    assert ports_reached(7001, 7009) == [7009]


def shaping(link):
    """What limits how fast an interface sends; nothing when nothing does."""
    found = run("tc", "qdisc", "show", "dev", link).stdout
    return found if "tbf" in found else ""


def test_an_interface_sends_no_faster_than_it_may():
    RATES.write_text("eth0 1000\n")
    for _ in range(2):
        run(SHAPER, "-start", "eth0", "gone0")
        assert "tbf 6b6f: root refcnt 2 rate 1Mbit" in shaping("eth0")
    with socket_on_other_side(socket.AF_INET, socket.SOCK_DGRAM) as receiver:
        receiver.bind((PARTNER, 7001))
        receiver.settimeout(30)
        begin = time.monotonic()
        with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as sender:
            for number in range(50):  # 70 kB, of which a burst of 32 kB goes at once
                sender.sendto(bytes([number]) * 1400, (PARTNER, 7001))
        while receiver.recv(2000)[0] != 49:
            pass
    assert time.monotonic() - begin > 0.25
    RATES.write_text("")
    run(SHAPER, "-change_interface", "eth0", "lan0")
    assert shaping("eth0") == ""


@pytest.mark.parametrize("value", ["0", "fast", "1000 more", "-5", "999999999", ""])
def test_a_rate_that_is_none_is_left_out_and_told(value, system_log):
    told = f"{RATES}: left out, not a number of kbit/s: eth0 {value}\n"
    RATES.write_text(f"eth0 {value}\nlan0 2000\n")
    run("tc", "qdisc", "add", "dev", "lan0", "root", "pfifo")
    assert run(SHAPER, "-start", "eth0", "lan0").stderr == f"tctool: {told}"
    assert shaping("eth0") == "" and "rate 2Mbit" in shaping("lan0")

    RATES.write_text(f"eth0 {value}\neth0 3000\neth0 4000\n")
    assert run(SHAPER, "-change_interface", "eth0", "lan0").stderr == f"tctool: {told.replace('eth0', 'lan0')}"
    assert RATES.read_text() == f"lan0 {value}\nlan0 3000\nlan0 4000\n", "a line that is none may be put right later"
    assert shaping("eth0") == "" and "rate 3Mbit" in shaping("lan0")
    wait_for(lambda: system_log.holds(told.replace("eth0", "lan0").rstrip()), what="the message in the system log")


def test_rules_follow_a_new_name_in_files_and_kernel():
    RULES.write_text("# eth0\neth0 drop udp 7001\n\n  eth0   drop   tcp 22\neth01 drop tcp 1\nlan0 drop tcp 2")
    LIMITS.write_text("eth0 syn 7\n")
    RATES.write_text("eth0 3000\n")
    load()
    run(SHAPER, "-start", "eth0")
    for program, verb in CHANGES.values():
        run(program, verb, "eth0", "lan0")
    assert RULES.read_text() == "# eth0\nlan0 drop udp 7001\n\nlan0 drop   tcp 22\neth01 drop tcp 1\nlan0 drop tcp 2\n"
    assert (LIMITS.read_text(), RATES.read_text()) == ("lan0 syn 7\n", "lan0 3000\n")
    assert filters("eth0") == "" and "dst_port 7001" in filters("lan0") and "pkts_rate 7" in filters("lan0")
    assert "rate 3Mbit" in shaping("lan0") and shaping("eth0") == ""
    assert ports_reached(7001, 7009) == [7001, 7009]


def test_where_the_kernel_cannot_the_file_follows_all_the_same_and_that_is_told(keep):
    keep("/usr/sbin/tc").write_text("#!/bin/sh\necho 'Error: TC classifier not found.' >&2\nexit 2\n")
    for path, rule in ((RULES, "drop udp 7001"), (LIMITS, "ping 5"), (RATES, "1000")):
        path.write_text(f"lan0 {rule}\n")
        program, verb = CHANGES[path]
        assert "eth0: " in (told := run(program, verb, "lan0", "eth0", status=1).stderr)
        assert "TC classifier not found" in told
        assert path.read_text() == f"eth0 {rule}\n"


@pytest.mark.parametrize("path", CHANGES)
def test_a_name_that_is_not_there_yet_changes_the_file(path):
    path.write_text("eth0 1\n" if path == RATES else "eth0 ping 1\n" if path == LIMITS else "eth0 drop icmp\n")
    path.chmod(0o600)
    program, verb = CHANGES[path]
    run(program, verb, "eth0", "eth0.10")
    assert path.read_text().startswith("eth0.10 ")
    assert path.stat().st_mode & 0o777 == 0o600
    run(program, verb, "gone0", "gone1")
    path.unlink()
    run(program, verb, "eth0", "eth0.10")
    assert not path.exists()


@pytest.mark.parametrize("names", [("", "eth1"), ("eth0", "../x"), ("eth0", "a b"), ("eth0", "sixteencharacter")])
def test_bad_names_change_nothing(names):
    for path, (program, verb) in CHANGES.items():
        path.write_text("eth0 1\n")
        assert "bad interface name" in run(program, verb, *names, status=1).stderr
        assert path.read_text() == "eth0 1\n"


@pytest.mark.parametrize("words", [(), ("-h",), ("--change-adapter", "eth0"), ("-change_interface", "a", "b", "c")])
def test_anything_else_is_bad_usage(words):
    for program in (FIREWALL, SHAPER):
        assert run(program, *words, status=2).stderr.startswith("usage: ")
