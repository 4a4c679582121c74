# box: --link eth0 --link lan0 --link lan1
# needs: bridge ppp pppoe
"""The PPPoE relay: clients on a bridge of the local LAN, in a namespace of their own, reach a server behind eth0."""

import ctypes
import pathlib
import shutil

import pytest
from conftest import Daemon, is_up, processes, run, wait_for, wait_for_answer
from pppoe_lab import PASSWORD, RELAY_SETTINGS, SERVER, USER, PppoeServer, apart, relays, write_bridge_files
from sdk import PppoeRelayConf, library, register

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
EXEC = 0x2A00
IP, HOSTNAME = 1, 2  # changes that the services are told of
BRIDGES = {"lbr0": "lan0", "lbr1": "lan1"}


@pytest.fixture(scope="module", autouse=True)
def clients_network():
    """The other ends of the local LAN are where the server is not."""
    run("ip", "netns", "add", "clients")
    for link in BRIDGES.values():
        run("ip", "-n", "net", "link", "set", link, "netns", "clients")
        run("ip", "-n", "clients", "link", "set", link, "up")
    run("ip", "-n", "net", "link", "set", "eth0", "up")
    run("ip", "link", "set", "eth0", "up")
    yield
    for link in BRIDGES.values():
        run("ip", "-n", "clients", "link", "set", link, "netns", "net")
    run("ip", "netns", "del", "clients")


@pytest.fixture(autouse=True)
def bridges(keep):
    """Two bridges of the local LAN, by their files and in the kernel."""
    for name in (*BRIDGES, *BRIDGES.values()):
        keep(SCRIPTS / f"ifcfg-{name}")
    write_bridge_files(BRIDGES)
    run("/etc/rc.network", "start", *BRIDGES)
    yield
    run("/sbin/stop", "pppoerelay")
    run("/etc/rc.network", "stop", *BRIDGES)
    shutil.rmtree(RELAY_SETTINGS, ignore_errors=True)


def store(bridge="lbr0", enabled=1, server="eth0"):
    conf = PppoeRelayConf(blEnabled=enabled, szServer=server.encode())
    assert library.KOVANetSetPPPoERelayConfig(bridge.encode(), ctypes.byref(conf)) == 0


def apply(bridge="lbr0"):
    return library.KOVANetApplyPPPoERelayConfig(bridge.encode())


def relays_are(*expected):
    """Waits, as one that goes to the background can be missed, and one that is told to end takes its time."""
    wait_for(lambda: sorted(relays().values()) == list(expected), what=f"relays {expected}")
    return list(relays())


def concentrator_seen(link="lan0"):
    """What a client on the local LAN finds."""
    words = ("pppoe-discovery", "-I", link, "-t", "1", "-a", "1")
    return "concentrator" in run("ip", "netns", "exec", "clients", *words, status=None).stdout


class Client(Daemon):
    """pppd on the local LAN."""

    def __init__(self, folder, link="lan0"):
        settings = folder / "client"
        settings.mkdir()
        (settings / "options").write_text(f'plugin pppoe.so\nnic-{link}\nuser "{USER}"\npassword "{PASSWORD}"\nnoauth\n'
                                          "nodetach\nnodefaultroute\nlcp-restart 1\n")  # fmt: skip
        super().__init__(apart("clients", settings, "pppd"), self.has_address, 60)

    def has_address(self):
        return f"peer {SERVER}" in run("ip", "-n", "clients", "-4", "addr").stdout


def test_a_session_through_the_relay(tmp_path, system_log):
    with PppoeServer(tmp_path):
        assert not concentrator_seen(), "there is no way but the relay"
        store()
        assert apply() == 0, register()
        relays_are("-C lbr0 -S eth0")
        with Client(tmp_path):
            wait_for_answer(SERVER, "ip", "netns", "exec", "clients")
            own = pathlib.Path("/sys/class/net/eth0/address").read_text().strip()
            wait_for(lambda: system_log.holds(f"created for client {own}"), what="a session of the relay's")

            store(enabled=0)
            assert apply() == 0
            relays_are()
            silent = run("ip", "netns", "exec", "clients", "ping", "-c", "1", "-W", "1", SERVER, status=1)
            assert "0 received" in silent.stdout


def test_a_relay_with_the_same_settings_is_left_alone():
    store()
    assert apply() == 0
    [pid] = relays_are("-C lbr0 -S eth0")
    assert (apply(), library.KOVANetApplyPPPoERelayConfigAll(), list(relays())) == (0, 0, [pid])


def test_another_server_is_another_relay():
    store()
    assert apply() == 0
    relays_are("-C lbr0 -S eth0")
    store(server="lan1")
    assert apply() == 0
    relays_are("-C lbr0 -S lan1")


@pytest.mark.parametrize("reason", ["off", "down", "no bridge of the local LAN", "no file"])
def test_a_relay_that_is_not_wanted_any_more_ends(reason):
    store("lbr1")
    store()
    assert library.KOVANetApplyPPPoERelayConfigAll() == 0
    relays_are("-C lbr0 -S eth0", "-C lbr1 -S eth0")
    if reason == "off":
        store(enabled=0)
    elif reason == "down":
        run("ip", "link", "set", "lbr0", "down")
        assert not is_up("lbr0")
    elif reason == "no file":
        (SCRIPTS / "ifcfg-lbr0").rename(SCRIPTS / "lbr0")
    else:
        (SCRIPTS / "ifcfg-lbr0").write_text("DEVICE=lbr0\nTYPE=bridge\nPRIMARY=lan0\nONBOOT=yes\nBOOTPROTO=none\n")
    try:
        assert apply() == 0, register()
        relays_are("-C lbr1 -S eth0")
    finally:
        write_bridge_files(BRIDGES)
        (SCRIPTS / "lbr0").unlink(missing_ok=True)


def test_a_server_that_is_not_there_is_told():
    store(server="nope0")
    assert apply() == -1 and register()[0] == EXEC
    relays_are()


def test_cleared_settings_leave_the_relay_running_until_they_are_applied():
    store()
    assert apply() == 0
    relays_are("-C lbr0 -S eth0")
    assert library.KOVANetClearPPPoERelayConfigAll() == 0
    assert list(RELAY_SETTINGS.iterdir()) == [] and len(relays()) == 1
    assert apply() == 0
    relays_are()
    assert (RELAY_SETTINGS / "lbr0").read_text() == ""


def test_the_relay_is_stopped_before_an_address_changes():
    store()
    assert apply() == 0
    relays_are("-C lbr0 -S eth0")
    assert library.KLIBServiceStopBeforeIPChange() == 0
    assert processes("/usr/sbin/pppoe-relay") == []
    assert apply() == 0, "and can be started again"
    relays_are("-C lbr0 -S eth0")


def test_the_relays_that_are_switched_on_come_back_once_an_address_has_changed():
    store()
    store("lbr1", enabled=0)
    assert library.KLIBServicePlugin(0, HOSTNAME) == 0
    assert not pathlib.Path("/run/kova/jobs/services,SERVICE=pppoe_relays").exists()
    assert library.KLIBServicePlugin(0, IP) == 0
    relays_are("-C lbr0 -S eth0")
    [pid] = relays()
    assert library.KLIBServicePlugin(0, IP) == 0
    wait_for(lambda: not processes("/etc/kova/jobs/services run"), what="the end of the job")
    assert list(relays()) == [pid], "one that runs stays"
    assert 'unknown service "radio"' in run("/sbin/start", "services", "SERVICE=radio", status=1).stderr


def test_the_job_runs_the_relay_too(tmp_path):
    store()
    with PppoeServer(tmp_path):
        run("/sbin/start", "pppoerelay", "IFACE=lbr0")
        wait_for(concentrator_seen, what="the server's answer")
        assert apply() == 0 and list(relays().values()) == ["-C lbr0 -S eth0 -F"], "it is the relay of these settings"
        run("/sbin/stop", "pppoerelay", "IFACE=lbr0")
        assert processes("/usr/sbin/pppoe-relay") == []
