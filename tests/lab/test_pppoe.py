# needs: ppp pppoe
"""The PPPoE client: dialled by the library, against a real server that asks for user and password."""

import os
import pathlib
import signal

import pytest
from conftest import kill, on_other_side, process, processes, routes, run, wait_for, wait_for_answer, wait_for_end
from pppoe_lab import (CACHE, CONF, KOVAINFO, PASSWORD, SECRETS, SERVER, USER, PppoeServer, clients, interface, is_enabled,
                       net_info, nothing_is_left, ppp_interfaces, store)
from sdk import library

START, STOP, REFUSED = 1, 0, 19
POOL = "10.67.0."


@pytest.fixture(autouse=True)
def files(keep):
    for path in (CONF, SECRETS, KOVAINFO, "/etc/resolv.conf"):
        keep(path)
    CONF.unlink(missing_ok=True)
    yield
    run("/usr/sbin/pppoe-stop")


@pytest.fixture
def server(tmp_path):
    with PppoeServer(tmp_path) as running:
        yield running


def dial():
    assert library.KOVAPPPoEService(START) == 0
    return interface()


def texts_of_processes():
    """Command lines and environments of everything that runs here, but for this test."""
    found = b""
    for folder in pathlib.Path("/proc").glob("[0-9]*"):
        if int(folder.name) != os.getpid():
            for name in ("cmdline", "environ"):
                try:
                    found += (folder / name).read_bytes()
                except OSError:
                    continue
    return found


def test_a_session_comes_up_and_goes(server, system_log):
    store()
    assert (library.KOVAPPPoECheckStatus(0), interface(), net_info()) == (0, None, None)
    assert dial() == "ppp0"

    assert (library.KOVAPPPoECheckStatus(0), library.KOVAPPPoECheckStatus(1), is_enabled()) == (1, 1, "yes")
    address, mask = net_info()
    assert address.startswith(POOL) and mask == "255.255.255.255"
    assert f"inet {address} peer {SERVER}/32" in run("ip", "addr", "show", "dev", "ppp0").stdout
    assert pathlib.Path("/sys/class/net/ppp0/mtu").read_text() == "1400\n"
    assert "eth0" in pathlib.Path("/proc/net/pppoe").read_text(), "a session in the kernel"
    assert CACHE.read_text() == "ppp0"
    wait_for_answer(SERVER)
    assert not routes("default"), "it was not asked for"

    assert PASSWORD.encode() not in texts_of_processes()
    assert SECRETS.stat().st_mode & 0o777 == 0o600
    assert run("grep", "-r", "-l", PASSWORD, "/run/kova", "/tmp/kovapppoe.intf", status=1).stdout == ""

    assert library.KOVAPPPoEService(STOP) == 0
    assert nothing_is_left() and is_enabled() == "no"
    assert (library.KOVAPPPoECheckStatus(0), interface(), net_info()) == (0, None, None)
    wait_for(lambda: not server.sessions(), what="the end of the session on the other side")
    assert system_log.holds("PAP authentication succeeded") and not system_log.holds(PASSWORD)


def test_a_wrong_password_is_refused(server, system_log):
    store(password="another-word")
    assert library.KOVAPPPoEService(START) == REFUSED
    assert is_enabled() == "no" and nothing_is_left()
    assert system_log.holds("pppoe-connect: user or password are refused")
    assert not system_log.holds("another-word")

    store()
    assert dial() == "ppp0", "the right one is taken the next time"


def test_without_a_server_the_start_gives_up(system_log):
    on_other_side("ip", "link", "set", "eth0", "up")
    store()
    assert library.KOVAPPPoEService(START) == -1
    assert is_enabled() == "no" and nothing_is_left()
    assert system_log.holds("pppoe-connect: no connection, pppd ended with ")


@pytest.mark.parametrize("change,complaint", [
    ({"link": "nope0"}, 'no interface "nope0"'), ({"link": ""}, 'no interface ""'),
    ({"mtu": "1400; r"}, "no connection"), ({"user": ""}, "no connection"),
])  # fmt: skip
def test_settings_that_cannot_work_end_the_start(system_log, change, complaint):
    store(**change)
    assert library.KOVAPPPoEService(START) == -1
    assert is_enabled() == "no" and nothing_is_left()
    assert system_log.holds(complaint)


@pytest.mark.parametrize("user,password", [("a'b \"c\\", "q'\" #\\ $x*"), ("#name*", "`word`")])
def test_user_and_password_of_any_characters(tmp_path, user, password):
    store(user=user, password=password)
    with PppoeServer(tmp_path, secrets={user: password}):
        assert dial() == "ppp0"
        assert library.KOVAPPPoEService(STOP) == 0


def test_the_default_route_and_the_name_servers_of_the_other_side(server):
    run("ip", "-batch", "-", input="addr add 192.168.50.9/24 dev eth0\nlink set eth0 up\n"
                                   "route add default via 192.168.50.1\n")  # fmt: skip
    try:
        store(default_route=True)
        dial()
        assert routes("default") == ["default dev ppp0 scope link"]
        wait_for(lambda: f"nameserver\t{SERVER}\n" in pathlib.Path("/etc/resolv.conf").read_text(), what="the server's DNS")
        assert library.KOVAPPPoEService(STOP) == 0
        assert routes("default") == ["default via 192.168.50.1 dev eth0"]
        assert not pathlib.Path("/etc/iproute2/config/resolv4.conf").exists()
    finally:
        run("ip", "addr", "flush", "dev", "eth0")


def test_a_connection_that_is_lost_comes_back(server):
    store()
    dial()
    first = server.sessions()
    for pid in first:
        os.kill(pid, signal.SIGTERM)
    wait_for(lambda: set(server.sessions()) - set(first) and net_info(), what="another session")
    assert (library.KOVAPPPoECheckStatus(1), is_enabled()) == (1, "yes")
    wait_for_answer(SERVER)


def test_a_password_that_changed_meanwhile_ends_it(server, system_log):
    store()
    dial()
    client = clients()
    server.know({USER: "a-new-word"})
    for pid in server.sessions():
        os.kill(pid, signal.SIGTERM)
    wait_for(lambda: not clients(), what="the end of the client")
    wait_for_end(client)
    assert system_log.holds("user or password are refused")
    assert (library.KOVAPPPoECheckStatus(1), is_enabled(), interface()) == (0, "no", None)


def test_a_start_takes_the_settings_as_they_are_now(server):
    store()
    dial()
    store(mtu="1300")
    dial()
    assert ppp_interfaces() == ["ppp0"] and pathlib.Path("/sys/class/net/ppp0/mtu").read_text() == "1300\n"
    assert process("/usr/sbin/pppoe-connect")


def test_disable_on_an_interface_ends_a_session_over_it_and_no_other(server):
    assert library.KLIBDisablePPPoEOnIf(b"eth0") == 0
    store()
    dial()
    assert library.KLIBDisablePPPoEOnIf(b"eth1") == 0
    assert library.KOVAPPPoECheckStatus(0) == 1 and net_info()

    assert library.KLIBDisablePPPoEOnIf(b"eth0") == 0
    assert nothing_is_left() and is_enabled() == "no"


def test_the_switch_follows_a_client_that_died(server):
    store()
    dial()
    kill(processes("/usr/sbin/pppoe-connect"))
    assert (library.KOVAPPPoECheckStatus(0), is_enabled()) == (0, "yes")
    assert (library.KOVAPPPoECheckStatus(1), is_enabled()) == (0, "no")

    assert dial() == "ppp0", "what was left of it is in nobody's way"
    assert library.KOVAPPPoEService(STOP) == 0
    assert nothing_is_left()


def test_a_client_that_is_not_meant_to_run_is_ended(server):
    store()
    run("/usr/sbin/pppoe-start")
    assert clients() and is_enabled() == "no"
    assert library.KOVAPPPoECheckStatus(0) == 0
    assert nothing_is_left()


def test_the_interface_of_a_cache_that_is_wrong_is_asked_anew(server):
    store()
    dial()
    CACHE.write_text("ppp7\n")
    assert net_info() is None and not CACHE.exists()
    assert net_info()[0].startswith(POOL) and CACHE.read_text() == "ppp0"
    # the mask alone is never told
    assert library.KOVAPPPoeNetInfoGet(None, 0, b" " * 16, 16) == -1


def test_stop_and_status_without_a_connection():
    run("/usr/sbin/pppoe-stop")
    assert run("/usr/sbin/pppoe-status", status=1).stdout == "The connection is down\n"
