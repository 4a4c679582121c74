# box: --link eth0 --link lan0 --link lan1
# needs: bridge ppp pppoe tun
"""The services at boot: behind the interfaces, the network script brings up what the files say is switched on."""

import ctypes
import pathlib
import shutil

import pppoe_lab
import pytest
import tunnel_lab
from conftest import keys_of, on_other_side, processes, run, wait_for
from dhcp_lab import FILES, SERVER, V4, clean_server, dhclient, switch, v4_subnet
from pppoe_lab import RELAY_SETTINGS, PppoeServer, clients, is_enabled, net_info, relays, write_bridge_files
from sdk import PppoeRelayConf, library
from tunnel_lab import LabBroker

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
STATIC = "ONBOOT=yes\nBOOTPROTO=static\nNETMASK=255.255.255.0\nIPADDR="
ADDRESSES = {"eth0": "192.168.50.10", "lan1": "192.168.60.1"}
BRIDGES = {"lbr0": "lan0"}
JOB = "/etc/kova/jobs/services run"


@pytest.fixture(autouse=True)
def interfaces(keep):
    """Files of two cards and of a bridge of the local LAN; nothing is up, and no service runs or is configured."""
    for name in (*ADDRESSES, *BRIDGES, *BRIDGES.values()):
        keep(SCRIPTS / f"ifcfg-{name}")
    for path in (pppoe_lab.CONF, pppoe_lab.SECRETS, pppoe_lab.KOVAINFO, tunnel_lab.ACCOUNT, tunnel_lab.RUN_KEY):
        keep(path)
    write_bridge_files(BRIDGES)
    for name, address in ADDRESSES.items():
        (SCRIPTS / f"ifcfg-{name}").write_text(f"DEVICE={name}\n{STATIC}{address}\n")
        on_other_side("ip", "link", "set", name, "up")
    on_other_side("ip", "addr", "replace", f"{tunnel_lab.SERVER}/24", "dev", "eth0")
    with clean_server("lan1"):
        yield
        run("/sbin/stop", "services")
        run("/usr/sbin/pppoe-stop")
        run("/sbin/stop", "pppoerelay")
        run(tunnel_lab.GOGOC / "rc.tun", "stop")
        wait_for(lambda: not processes("/etc/gogoc/rc.tun"), what="the end of the tunnel's script")
        run("/etc/rc.network", "stop")
        shutil.rmtree(RELAY_SETTINGS, ignore_errors=True)
    on_other_side("ip", "addr", "flush", "dev", "eth0", "scope", "global")


@pytest.fixture
def other_sides(tmp_path):
    with PppoeServer(tmp_path), LabBroker(tmp_path):
        yield


def relay(bridge, enabled=True, server="eth0"):
    conf = PppoeRelayConf(blEnabled=enabled, szServer=server.encode())
    assert library.KOVANetSetPPPoERelayConfig(bridge.encode(), ctypes.byref(conf)) == 0


def configure(on=True):
    """All services, with their switches on, or off."""
    switch("dhcpd", on)
    assert library.DHCPInterfaceSetEnabled(b"lan1", V4, 1) == 0
    assert library.DHCPTagConfSet(b"lan1", 0, V4, ctypes.byref(v4_subnet("192.168.60"))) == 0
    pppoe_lab.store()
    switch_pppoe(on)
    relay("lbr0", on)
    assert library.KOVATunnelConfigSet(ctypes.byref(tunnel_lab.anonymous())) == 0
    tunnel_lab.RUN_KEY.write_text(f"run={'yes' if on else 'no'}\n")


def switch_pppoe(on):
    keys = {**keys_of(pppoe_lab.KOVAINFO), "pppoe_enable": '"yes"' if on else '"no"'}
    pppoe_lab.KOVAINFO.write_text("".join(f"{key}={value}\n" for key, value in keys.items()))


def boot():
    assert run("/etc/rc.network", "start").stderr == ""


def wait_for_the_job():
    wait_for(lambda: not processes(JOB), 60, "the end of the job")
    assert pathlib.Path("/run/kova/jobs/services").exists(), "there was none"


def relay_is_there():
    return list(relays().values()) == ["-C lbr0 -S eth0"]


def tunnel_clients():
    return processes(tunnel_lab.CLIENT)


def test_what_is_switched_on_is_there_after_the_boot(other_sides, tmp_path):
    configure()
    boot()
    wait_for(lambda: processes(SERVER), 60, "the DHCP server")
    assert dhclient("lan1", tmp_path)["ip_address"].startswith("192.168.60.")
    wait_for(net_info, 60, "the session")
    wait_for(relay_is_there, 60, "the relay")
    wait_for(tunnel_lab.addresses, 60, "the tunnel")
    run("ping", "-6", "-c", "1", "-W", "10", tunnel_lab.FAR)
    assert (library.KOVAPPPoECheckStatus(0), is_enabled()) == (1, "yes")
    wait_for_the_job()
    assert not tunnel_lab.CONF.exists()

    before = (clients(), list(relays()), tunnel_clients())
    boot()
    wait_for_the_job()
    wait_for(lambda: processes(SERVER), what="the DHCP server, which was run anew")
    assert (clients(), list(relays()), tunnel_clients()) == before, "what runs already stays"


def test_what_is_switched_off_is_not_there(other_sides):
    configure(on=False)
    boot()
    wait_for_the_job()
    assert not processes(SERVER) and not clients() and not relays() and not tunnel_clients()
    assert is_enabled() == "no" and tunnel_lab.RUN_KEY.read_text() == "run=no\n"


def test_interfaces_that_are_named_start_no_service():
    configure()
    run("/etc/rc.network", "start", "eth0")
    run("/etc/rc.network", "restart", "lan1")
    assert not pathlib.Path("/run/kova/jobs/services").exists() and not processes(JOB)


def test_what_fails_or_hangs_stops_nothing_else(other_sides, system_log, hold):
    configure()
    pppoe_lab.store(link="nope0")
    relay("abr0")
    relay("zbr0", server="")
    held = hold("/usr/bin/kovanet", "tunnel start")
    boot()
    wait_for(held.is_waiting, what="the tunnel")
    for condition in (lambda: processes(SERVER), relay_is_there, lambda: system_log.holds('pppoe: no interface "nope0"'),
                      lambda: system_log.holds("services: abr0 is not relayed now: it is no bridge of the local LAN")):  # fmt: skip
        wait_for(condition, 60)
    assert not clients() and not tunnel_clients() and processes(JOB)
    (FILES / "dhcpd.info").unlink()  # nothing of it is read again
    held.release()
    wait_for(tunnel_lab.addresses, 60, "the tunnel")
    wait_for_the_job()
    for service, complaints in {"pppoe": 1, "services: abr0": 1, "services: zbr0": 1}.items():
        assert sum(f" {service}" in message for message in system_log.messages) == complaints, service


def test_a_tunnel_that_does_not_come_is_told(system_log):
    configure()
    tunnel_lab.ACCOUNT.unlink()
    boot()
    wait_for_the_job()
    assert system_log.holds("services: no tunnel broker is configured; first: kovanet tunnel set")
    assert processes(SERVER) and relay_is_there() and not tunnel_clients()


def test_a_server_that_comes_later_is_dialled_then(tmp_path, system_log):
    configure()
    tunnel_lab.RUN_KEY.write_text("run=no\n")
    boot()
    wait_for(lambda: system_log.holds("pppoe-connect: there is no connection, pppd ended with"), 60, "a dial that failed")
    assert is_enabled() == "yes" and net_info() is None and library.KOVAPPPoECheckStatus(1) == 1
    with PppoeServer(tmp_path):
        wait_for(net_info, 60, "the session")
        assert library.KOVAPPPoEService(0) == 0
        assert pppoe_lab.nothing_is_left() and is_enabled() == "no"


def test_a_password_that_is_refused_at_boot_is_not_tried_again(tmp_path, system_log):
    configure()
    pppoe_lab.store(password="another-word")
    with PppoeServer(tmp_path):
        boot()
        wait_for(lambda: system_log.holds("pppoe-connect: user or password are refused"), 60, "the refusal")
        wait_for(lambda: not clients(), what="the end of the client")
    assert (library.KOVAPPPoECheckStatus(1), is_enabled()) == (0, "no")
