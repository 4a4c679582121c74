# box: --link eth0 --link kx12
"""The DHCP server: the library's files, dnsmasq on them, and real clients on the other side; the client's test mode."""

import ctypes
import os
import pathlib
import socket
import subprocess

import pytest
from conftest import DhcpServer, addresses, is_up, process, processes, run, wait_for
from dhcp_lab import (
    CLIENT, FILES, LEASES, PID, SERVED, SERVER, V4, bring_up, clean_server, dhclient, served_lines, switch,
)  # fmt: skip
from sdk import DhcpTagConf, NetInfo, core, library, register

LINKS = ("eth0", "kx12")


@pytest.fixture(autouse=True)
def server():
    with clean_server(*LINKS):
        yield
        for link in LINKS:
            run("/sbin/stop", "dhcp-client", f"IFACE={link}")
            pathlib.Path(f"/tmp/dhcpv4.leases.{link}").unlink(missing_ok=True)


def subnet(link, network, tag="lan", dns=("192.168.60.53", "192.168.60.54"), domain="lab.example"):
    """A subnet as the library's callers describe it."""
    return DhcpTagConf(
        ifname=link.encode(), tag=tag.encode(), start_ip=f"{network}.10".encode(), end_ip=f"{network}.20".encode(),
        netmask=b"255.255.255.0", lease_time=3600, router=f"{network}.1".encode(), domain=domain.encode(),
        dns1=dns[0].encode(), dns2=dns[1].encode(),
    )  # fmt: skip


def configure(link, network, **more):
    """Switches service and interface on, gives the interface its address, and has the library write the subnet."""
    bring_up(link, f"{network}.1/24")
    switch("dhcpd")
    assert library.DHCPInterfaceSetEnabled(link.encode(), V4, 1) == 0
    assert library.KOVANetSetDhcpServerConfigFiles(ctypes.byref(subnet(link, network, **more)), 1) == 1


def ask(link, folder):
    return dhclient(link, folder, request=("subnet-mask", "routers", "domain-name-servers", "domain-search"))


def test_client_gets_what_the_library_wrote(tmp_path):
    configure("eth0", "192.168.60")
    assert library.DHCPServerRestart() == 0
    lease = ask("eth0", tmp_path)
    assert lease["ip_address"] in [f"192.168.60.{host}" for host in range(10, 21)]
    assert lease["subnet_mask"] == "255.255.255.0"
    assert lease["routers"] == "192.168.60.1"
    assert lease["domain_name_servers"] == "192.168.60.53 192.168.60.54"
    assert lease["domain_search"].rstrip(".") == "lab.example"
    assert lease["dhcp_lease_time"] == "3600"
    assert lease["dhcp_server_identifier"] == "192.168.60.1"


def test_start_and_both_restarts_run_one_server():
    configure("eth0", "192.168.60")
    assert library.DHCPServerStart() == 0
    first = process(SERVER)
    assert library.DHCPServerRestart() == 0
    assert library.KLIBNetDHCPServerRestart() == 0
    last = process(SERVER)
    assert last != first
    assert PID.read_text().split() == [str(last)]


def test_restarts_at_the_same_time_run_one_server():
    configure("eth0", "192.168.60")
    restarts = [subprocess.Popen(["/etc/rc.network", "nat-restart-dhcp"]) for _ in range(3)]
    assert [restart.wait(120) for restart in restarts] == [0, 0, 0]
    assert PID.read_text().split() == [str(pid) for pid in processes(SERVER)]


def test_lease_is_remembered_over_a_restart(tmp_path):
    configure("eth0", "192.168.60")
    assert library.DHCPServerRestart() == 0
    leased = ask("eth0", tmp_path)["ip_address"]
    assert library.DHCPServerRestart() == 0
    assert leased in LEASES.read_text()


@pytest.mark.parametrize("name", ["dhcpd", "dhcpd-eth0", "dhcpd-eth0-lan"])
def test_each_switch_ends_the_service(name):
    configure("eth0", "192.168.60")
    assert library.DHCPServerRestart() == 0
    assert processes(SERVER)
    switch(name, on=False)
    assert library.DHCPServerRestart() == 0
    assert not processes(SERVER) and not PID.exists()
    (FILES / f"{name}.info").unlink()
    assert library.DHCPServerRestart() == 0
    assert not processes(SERVER)


def test_without_files_there_is_nothing_to_serve():
    assert library.DHCPServerRestart() == 0
    assert not processes(SERVER)


def test_only_what_is_switched_on_is_served():
    configure("eth0", "192.168.60")
    configure("kx12", "192.168.61")
    switch("dhcpd-kx12", on=False)
    for name, line in {
        "dhcpd-eth0-static": "dhcp-host=02:00:00:00:00:01,192.168.60.30",
        "dhcpd-kx12-static": "dhcp-host=02:00:00:00:00:02,192.168.61.30",
        "dhcpd-vendor": "dhcp-option=vendor:MSFT,2,1i",
        "dhcpd-pxe": "dhcp-vendorclass=set:pxe,PXEClient",
        "wpad-eth0": "dhcp-option=tag:lan,252,http://192.168.60.1/wpad.dat",
        "wpad-kx12": "dhcp-option=tag:lan,252,http://192.168.61.1/wpad.dat",
        "dhcpd-eth0-subnet0": "interface=eth0\ndhcp-range=set:eth00,192.168.62.10,192.168.62.20,255.255.255.0,600",
        "dhcpd6-eth0-subnet0": "interface=eth0\ndhcp-range=set:eth0v60,::,constructor:eth0,ra-only,64,600",
        "dhcpd6-eth0-subnet1": "interface=eth0\ndhcp-range=set:eth0v61,::,constructor:eth0,ra-only,64,700",
        "other": "dhcp-option=3,6.6.6.6",
    }.items():
        (FILES / f"{name}.conf").write_text(line + "\n")
    for name in ("wpad-eth0", "wpad-kx12", "dhcpd-pxe", "dhcpd6-eth0", "dhcpd6-eth0-subnet1", "other"):
        switch(name)
    assert library.DHCPServerRestart() == 0
    assert [line for line in served_lines() if line.startswith("#")] == [
        "# dhcpd-eth0-lan", "# dhcpd-eth0-static", "# dhcpd-pxe", "# dhcpd-vendor", "# dhcpd6-eth0-subnet1",
        "# wpad-eth0",
    ]  # fmt: skip
    written = [line for name in ("dhcpd-eth0-lan", "dhcpd-eth0-static", "dhcpd-pxe", "dhcpd-vendor",
                                 "dhcpd6-eth0-subnet1", "wpad-eth0")
               for line in (FILES / f"{name}.conf").read_text().splitlines()]  # fmt: skip
    assert [line for line in served_lines() if not line.startswith("#")] == written
    switch("dhcpd-pxe", on=False)
    switch("wpad-eth0", on=False)
    assert library.DHCPServerRestart() == 0
    assert not [line for line in served_lines() if "pxe" in line or "wpad" in line]


def test_line_that_the_server_refuses_costs_only_itself(tmp_path, system_log):
    configure("eth0", "192.168.60", dns=("", ""))
    fragment = FILES / "dhcpd-eth0-lan.conf"
    assert fragment.read_text().endswith("option:dns-server,\n")
    before = fragment.read_text()
    assert library.DHCPServerRestart() == 0
    lease = ask("eth0", tmp_path)
    assert lease["routers"] == "192.168.60.1"
    assert lease["domain_search"].rstrip(".") == "lab.example"
    wait_for(lambda: system_log.holds('dhcpd-eth0-lan.conf: left out "dhcp-option=tag:lan,option:dns-server,"'))
    assert fragment.read_text() == before


def test_lines_too_long_to_be_read_are_left_out(system_log):
    configure("eth0", "192.168.60")
    with (FILES / "dhcpd-eth0-lan.conf").open("a") as fragment:
        fragment.write(f"dhcp-option=tag:lan,option:domain-search,{'x' * 2000}\n")
    assert library.DHCPServerRestart() == 0
    wait_for(lambda: system_log.holds('": too long'))
    assert processes(SERVER)
    assert not [line for line in served_lines() if "xxx" in line]


@pytest.mark.parametrize(
    "broken",
    [
        b"interface=eth0\ndhcp-range=set:lan,192.168.60.300,192.168.60.20,255.255.255.0,600\n",
        b"interface=eth0\n",
        b"dhcp-range=set:lan,192.168.60.10,192.168.60.20,255.255.255.0,600\n",
        b"interface=kx12\ndhcp-range=set:lan,192.168.60.10,192.168.60.20,255.255.255.0,600\n",
        b"\0\xff\xfe\x01" * 1000,
        b"bogus\n" * 200,
        b"",
    ],
)
def test_broken_fragment_costs_no_other_its_service(tmp_path, system_log, broken):
    configure("eth0", "192.168.60")
    configure("kx12", "192.168.61")
    (FILES / "dhcpd-eth0-lan.conf").write_bytes(broken)
    assert library.DHCPServerRestart() == 0
    wait_for(lambda: system_log.holds("dhcpd-eth0-lan.conf: left out, "), what="the log line")
    assert [line for line in served_lines() if line.startswith("#")] == ["# dhcpd-kx12-lan"]
    assert ask("kx12", tmp_path)["routers"] == "192.168.61.1"


def test_broken_fragment_read_last_is_no_failure(system_log):
    configure("eth0", "192.168.60")
    configure("kx12", "192.168.61")
    (FILES / "dhcpd-kx12-lan.conf").write_text("interface=kx12\n")
    assert library.KLIBNetDHCPServerRestart() == 0
    wait_for(lambda: system_log.holds("dhcpd-kx12-lan.conf: left out, "))
    assert [line for line in served_lines() if line.startswith("#")] == ["# dhcpd-eth0-lan"]


def test_fragments_that_contradict_each_other_do_not_stop_the_service(system_log):
    configure("eth0", "192.168.60")
    configure("kx12", "192.168.61")
    (FILES / "dhcpd-eth0-static.conf").write_text("dhcp-host=02:00:00:00:00:01,192.168.60.30\n")
    (FILES / "dhcpd-kx12-static.conf").write_text("dhcp-host=02:00:00:00:00:02,192.168.60.30\n")
    assert library.DHCPServerRestart() == 0
    assert processes(SERVER)
    wait_for(lambda: system_log.holds("dhcpd-kx12-static.conf: left out"))


def test_last_line_without_newline_is_served():
    configure("eth0", "192.168.60")
    fragment = FILES / "dhcpd-eth0-lan.conf"
    fragment.write_text(fragment.read_text().rstrip("\n"))
    configure("kx12", "192.168.61")
    assert library.DHCPServerRestart() == 0
    assert "dhcp-option=tag:lan,option:dns-server,192.168.60.53,192.168.60.54" in served_lines()


def test_server_that_cannot_start_is_a_failure(system_log):
    configure("eth0", "192.168.60")
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as port:
        port.bind(("0.0.0.0", 67))
        assert library.DHCPServerRestart() == 1
        assert library.KLIBNetDHCPServerRestart() == -1
        wait_for(lambda: system_log.holds("the server does not start: "))
        assert not processes(SERVER)
    assert library.DHCPServerRestart() == 0


def test_missing_server_is_a_failure(keep):
    configure("eth0", "192.168.60")
    keep("/usr/sbin/dnsmasq").unlink()
    assert library.DHCPServerRestart() == 1
    assert "cannot run /usr/sbin/dnsmasq" in run("/etc/rc.network", "nat-start-dhcp", status=1).stderr


@pytest.mark.parametrize("refuses", ["", 'case "$*" in *--test*) exit 0 ;; esac'], ids=["all", "the start"])
def test_server_that_refuses_is_a_failure(keep, system_log, refuses):
    configure("eth0", "192.168.60")
    keep("/usr/sbin/dnsmasq").write_text(f"#!/bin/sh\n{refuses}\necho out of order >&2\nexit 5\n")
    assert library.KLIBNetDHCPServerRestart() == -1
    assert (library.DHCPServerStart(), library.DHCPServerRestart()) == (1, 1)
    wait_for(lambda: system_log.holds("out of order"))
    assert not system_log.holds("left out")
    assert not processes(SERVER)


def test_number_of_another_process_is_not_ended():
    configure("eth0", "192.168.60")
    SERVED.parent.mkdir(parents=True, exist_ok=True)
    PID.write_text(f"{os.getpid()}\n")
    assert library.DHCPServerRestart() == 0
    assert PID.read_text().split() == [str(pid) for pid in processes(SERVER)]


def test_restart_waits_for_no_lock_and_keeps_none():
    configure("eth0", "192.168.60")
    assert core.KLIBCFileLock(0x106, 5) == 0
    try:
        assert library.DHCPServerRestart() == 0
    finally:
        core.KLIBCFileUnlock(0x100)
    server = process(SERVER)
    opened = [os.readlink(path) for path in pathlib.Path(f"/proc/{server}/fd").iterdir()]
    assert not [path for path in opened if "lock" in path]


# ---- the client's test mode ------------------------------------------------------------------------------------------


@pytest.fixture
def network(tmp_path):
    with DhcpServer("eth0", "192.168.50", folder=tmp_path) as daemon:
        yield daemon


def ask_network(link):
    """The library's answer: result, address, mask."""
    info = NetInfo(szIfname=link.encode())
    result = library.KOVAIGetDHCPTestNetInfo(ctypes.byref(info))
    return result, info.szIP.decode(), info.szMask.decode()


def info_file(link):
    return pathlib.Path(f"/etc/dhclient/ipv4/dhcpcd-{link}.info")


@pytest.mark.parametrize("was_up", [False, True])
def test_network_is_asked_and_the_interface_left_alone(network, was_up):
    run("ip", "link", "set", "eth0", "up" if was_up else "down")
    before = addresses("eth0")
    result, address, mask = ask_network("eth0")
    assert (result, mask) == (0, "255.255.255.0")
    assert address in [f"192.168.50.{host}" for host in range(10, 21)]
    assert f" {address} " in network.text()
    assert addresses("eth0") == before == []
    assert is_up("eth0") == was_up
    assert not processes(CLIENT)
    assert info_file("eth0").read_text() == f"IPADDR={address}\nNETMASK={mask}\nOFFER=yes\n"
    assert not pathlib.Path("/etc/dhclient/ipv4/dhcpcd-eth0.pid").exists()
    assert not pathlib.Path("/etc/iproute2/config/resolv4.conf").exists()


def test_static_address_stays_while_the_network_is_asked(network):
    run("ip", "addr", "add", "10.1.1.1/24", "dev", "eth0")
    run("ip", "link", "set", "eth0", "up")
    assert ask_network("eth0")[0] == 0
    assert addresses("eth0") == ["10.1.1.1/24"]


def test_own_lease_stays_whole_while_the_network_is_asked(network):
    run("/sbin/start", "dhcp-client", "IFACE=eth0")
    wait_for(lambda: addresses("eth0"), what="the lease")
    before = info_file("eth0").read_text()
    assert ask_network("eth0") == (0, addresses("eth0")[0].removesuffix("/24"), "255.255.255.0")
    assert info_file("eth0").read_text() == before
    assert processes(f"{CLIENT} -4")


def test_network_without_a_server_is_told_and_an_old_answer_not_given():
    info_file("eth0").write_text("IPADDR=192.168.50.99\nNETMASK=255.255.255.0\n")
    assert ask_network("eth0") == (-1, "", "")
    assert register() == (0x2A00, "get_dhcp_test_net_info")
    assert addresses("eth0") == []
    assert not processes(CLIENT)
    info_file("eth0").unlink()


def test_interface_that_is_not_there_is_told():
    assert ask_network("nosuch0") == (-1, "", "")
    assert register() == (0x2A00, "get_dhcp_test_net_info")


def test_script_of_a_stranger_is_not_run(network, tmp_path):
    script = pathlib.Path("/tmp/dhclient-script")
    mark = tmp_path / "run"
    script.unlink(missing_ok=True)
    script.write_text(f"#!/bin/sh\ntouch {mark}\n")
    script.chmod(0o777)
    assert ask_network("eth0") == (-1, "", "")
    assert register() == (0x2A00, "get_dhcp_test_net_info")
    assert not mark.exists()
    script.unlink()
    assert ask_network("eth0")[0] == 0


def test_other_calls_reach_the_real_client():
    assert run("/usr/sbin/dhclient", "--version").stderr.startswith("isc-dhclient")


def test_link_in_place_of_the_leases_is_not_followed(network, tmp_path):
    victim = tmp_path / "victim"
    victim.write_text("untouched")
    os.symlink(victim, "/tmp/dhcpv4.leases.eth0")
    assert ask_network("eth0")[0] == 0
    assert victim.read_text() == "untouched"
