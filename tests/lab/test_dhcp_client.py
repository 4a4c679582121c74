# box: --link lan0 --link kx12
"""The dhcp-client job: the real client against a real server on the other side."""

import os
import pathlib
import signal
import subprocess
import time

import pytest
from conftest import SLOWNESS, DhcpServer, addresses, is_up, processes, routes, run, wait_for

SOURCE = pathlib.Path("/etc/iproute2/config/resolv4.conf")
RESOLV = pathlib.Path("/etc/resolv.conf")
SCRIPT = "/usr/kova/lib/dhcp-client-script"
SERVERS = "--dhcp-option=option:dns-server,192.168.50.53,192.168.50.54"
LINKS = ("lan0", "kx12")


@pytest.fixture(autouse=True)
def no_client_left(keep):
    keep(RESOLV)
    keep("/etc/sysconfig/network")
    keep("/etc/iproute2/config/static-route4.conf")
    yield
    for link in LINKS:
        run("/sbin/stop", "dhcp-client", f"IFACE={link}")
        run("ip", "addr", "flush", "dev", link)
        pathlib.Path(f"/tmp/dhcpv4.leases.{link}").unlink(missing_ok=True)
    for unfinished in (*SOURCE.parent.glob("resolv4*.*.*"), *info_of("*").parent.glob("*.info.*")):
        unfinished.unlink()  # what a script that is killed while it writes may leave


@pytest.fixture
def server(tmp_path):
    with DhcpServer("lan0", "192.168.50", SERVERS, "--dhcp-option=option:domain-name,lab.example",
                    folder=tmp_path) as daemon:  # fmt: skip
        yield daemon


def info_of(link):
    return pathlib.Path(f"/etc/dhclient/ipv4/dhcpcd-{link}.info")


def read_info(link):
    return dict(line.split("=", 1) for line in info_of(link).read_text().splitlines())


def start(link, status=0):
    return run("/sbin/start", "dhcp-client", f"IFACE={link}", status=status)


def stop(link):
    return run("/sbin/stop", "dhcp-client", f"IFACE={link}")


def wait_bound(link):
    """Until the script that takes the lease is at its end."""
    wait_for(info_of(link).exists, what=f"a lease on {link}")
    wait_for(lambda: not processes(f"sh {SCRIPT}"), what="the end of the script")


def assert_nothing_left(link):
    assert not processes("/sbin/dhclient") and not processes(f"sh {SCRIPT}")
    assert addresses(link) == []
    assert routes("dev", link) == []
    assert not info_of(link).exists()
    assert not SOURCE.exists()


def test_lease_sets_address_route_info_and_resolver_source(server):
    start("lan0")
    wait_for(SOURCE.exists, what="the resolver source")

    info = read_info("lan0")
    address = info.pop("IPADDR")
    assert f" {address} " in server.text()
    assert addresses("lan0") == [f"{address}/24"]
    assert is_up("lan0")
    assert info == {
        "NETMASK": "255.255.255.0",
        "NETWORK": "192.168.50.0",
        "BROADCAST": "192.168.50.255",
        "ROUTER": "192.168.50.1",
        "GATEWAY": "192.168.50.1",
        "DNS": "192.168.50.53 192.168.50.54",
        "DOMAIN": "lab.example",
        "LEASETIME": "600",
    }
    assert info_of("lan0").stat().st_mode & 0o777 == 0o644
    assert SOURCE.read_text() == "nameserver\t192.168.50.53\nnameserver\t192.168.50.54\n"
    wait_for(lambda: routes("default") == ["default via 192.168.50.1 dev lan0"], what="the default route")
    leases = pathlib.Path("/tmp/dhcpv4.leases.lan0")  # which the client writes anew in place
    wait_for(lambda: address in leases.read_text(), what="the lease in its file")
    wait_for(lambda: RESOLV.read_text() == SOURCE.read_text(), what="the resolver file made of the source")
    run("ping", "-c", "1", "-W", "5", "192.168.50.1")


def test_stop_leaves_nothing(server):
    start("lan0")
    wait_bound("lan0")
    stop("lan0")
    assert_nothing_left("lan0")
    assert not list(SOURCE.parent.glob("resolv4*")) and not list(info_of("lan0").parent.glob("*info*"))


def test_lease_is_asked_for_again_after_a_restart(server):
    start("lan0")
    wait_bound("lan0")
    leased, discovers = addresses("lan0"), server.text().count("DHCPDISCOVER")
    stop("lan0")
    start("lan0")
    wait_bound("lan0")
    assert addresses("lan0") == leased
    assert server.text().count("DHCPDISCOVER") == discovers  # the second time the lease file was there


def test_static_address_stays_until_the_lease_and_goes_with_it(server):
    run("ip", "addr", "add", "10.1.1.1/24", "dev", "lan0")
    run("ip", "link", "set", "lan0", "up")
    start("lan0")
    wait_bound("lan0")
    assert addresses("lan0") == [f"{read_info('lan0')['IPADDR']}/24"]


def test_stop_without_a_lease_leaves_the_static_address():
    run("ip", "addr", "add", "10.1.1.1/24", "dev", "lan0")
    start("lan0")
    wait_for(lambda: processes("/sbin/dhclient"))
    stop("lan0")
    assert addresses("lan0") == ["10.1.1.1/24"]


def test_lease_of_an_earlier_boot_is_forgotten():
    info_of("lan0").write_text("IPADDR=192.168.50.99\nNETMASK=255.255.255.0\nDNS=192.168.50.53\n")
    start("lan0")
    wait_for(lambda: not info_of("lan0").exists(), what="the end of the old info file")
    assert not SOURCE.exists()


def test_two_interfaces_share_the_resolver_source(server, tmp_path):
    servers = "--dhcp-option=option:dns-server,192.168.51.53"
    with DhcpServer("kx12", "192.168.51", servers, folder=tmp_path):
        for link in LINKS:
            start(link)
        for link in LINKS:
            wait_bound(link)
        expected = {"192.168.50.53", "192.168.50.54", "192.168.51.53"}
        assert set(SOURCE.read_text().replace("nameserver\t", "").split()) == expected
        stop("lan0")
        assert SOURCE.read_text() == "nameserver\t192.168.51.53\n"
        assert addresses("kx12")
        stop("kx12")
        assert_nothing_left("kx12")


@pytest.mark.parametrize(
    ("gateway", "default"),
    [("192.168.50.77", ["default via 192.168.50.77 dev lan0"]), ("10.99.0.1", []), ("", None)],
)
def test_configured_gateway_wins_over_the_servers(server, gateway, default):
    pathlib.Path("/etc/sysconfig/network").write_text(f"GATEWAY={gateway}\n")
    pathlib.Path("/etc/iproute2/config/static-route4.conf").write_text("10.20.0.0/16 192.168.50.254 lan0\n")
    start("lan0")
    wait_bound("lan0")
    assert routes("default") == (["default via 192.168.50.1 dev lan0"] if default is None else default)
    assert routes("10.20.0.0/16") == ["10.20.0.0/16 via 192.168.50.254 dev lan0"]


def test_interface_that_is_not_there_is_refused():
    assert 'no interface "nosuch0"' in start("nosuch0", status=1).stderr
    assert "no interface" in run("/sbin/start", "dhcp-client", status=1).stderr


def test_client_that_is_missing_is_reported(keep):
    client = keep("/sbin/dhclient")
    client.unlink()
    assert "cannot run /sbin/dhclient" in start("lan0", status=1).stderr


def test_lease_file_that_is_a_link_is_not_followed(server, tmp_path):
    victim = tmp_path / "victim"
    victim.write_text("untouched")
    os.symlink(victim, "/tmp/dhcpv4.leases.lan0")
    start("lan0")
    wait_bound("lan0")
    assert victim.read_text() == "untouched"


# ---- a stopped client does nothing any more ------------------------------------------------------------------------


def test_stop_at_any_time_of_a_bind_ends_the_client_for_good(server):
    """Measures how long a bind takes, then stops the client at 24 points of that span."""
    began = time.monotonic()
    start("lan0")
    wait_for(SOURCE.exists, what="the resolver source")
    span = time.monotonic() - began
    stop("lan0")
    for turn in range(24):
        start("lan0")
        time.sleep(span * turn / 23)
        stop("lan0")
        assert_nothing_left("lan0")


@pytest.mark.parametrize(
    ("program", "text"),
    [("/usr/bin/sync", "dhcpcd-lan0.info"), ("/usr/sbin/ip", "addr replace"), ("/usr/sbin/ip", "route replace"),
     ("/usr/bin/sync", "resolv4.conf")],
)  # fmt: skip
@pytest.mark.parametrize("client_dies", [False, True])
def test_stop_in_the_middle_of_a_bind(server, hold, program, text, client_dies):
    step = hold(program, text)
    start("lan0")
    wait_for(step.is_waiting, what="the bind")
    if client_dies:
        os.kill(int(pathlib.Path("/run/kova/jobs/dhcp-client,IFACE=lan0").read_text().split()[0]), signal.SIGKILL)
        wait_for(lambda: not processes("/sbin/dhclient -4"), what="the client's end")
    assert processes(text)  # what must not outlive the stop

    began = time.monotonic()
    stop("lan0")
    assert time.monotonic() - began < 60 * SLOWNESS  # 1.2 on an idle machine
    assert not processes(text)
    step.release()  # what had survived would go on now
    assert_nothing_left("lan0")


# ---- the script, as the client runs it -----------------------------------------------------------------------------


def script(reason, status=0, **lease):
    environment = {"PATH": os.environ["PATH"], "reason": reason, "interface": "lan0", **lease}
    return run(SCRIPT, env=environment, status=status)


LEASE = {
    "new_ip_address": "192.168.50.30",
    "new_subnet_mask": "255.255.255.0",
    "new_routers": "192.168.50.1 192.168.50.2",
    "new_domain_name_servers": "192.168.50.53",
    "new_dhcp_lease_time": "600",
}


@pytest.mark.parametrize("reason", ["BOUND", "RENEW", "REBIND", "REBOOT"])
def test_every_kind_of_lease_is_taken(reason):
    script("PREINIT")
    script(reason, **LEASE)
    assert addresses("lan0") == ["192.168.50.30/24"]
    assert read_info("lan0")["ROUTER"] == "192.168.50.1"


@pytest.mark.parametrize("reason", ["EXPIRE", "FAIL", "RELEASE", "STOP", "PREINIT"])
def test_end_of_a_lease_takes_back_what_it_set(reason):
    script("PREINIT")
    script("BOUND", **LEASE)
    run("ip", "addr", "add", "10.7.7.7/24", "dev", "lan0")
    script(reason)
    assert addresses("lan0") == ["10.7.7.7/24"]
    assert routes("default") == []
    assert not info_of("lan0").exists()
    assert not SOURCE.exists()


def test_renewed_lease_leaves_the_address_in_place():
    script("PREINIT")
    script("BOUND", **LEASE)
    run("ip", "route", "add", "10.55.0.0/16", "via", "192.168.50.9")
    script("RENEW", **{**LEASE, "new_domain_name_servers": "192.168.50.55", "new_dhcp_lease_time": "900"})
    assert addresses("lan0") == ["192.168.50.30/24"]
    assert routes("10.55.0.0/16")  # an address that had been away for a moment would have cost it
    assert SOURCE.read_text() == "nameserver\t192.168.50.55\n"
    assert read_info("lan0")["LEASETIME"] == "900"


def test_other_address_replaces_the_one_before():
    script("PREINIT")
    script("BOUND", **LEASE)
    script("RENEW", **{**LEASE, "new_ip_address": "192.168.51.40", "new_routers": "192.168.51.1"})
    assert addresses("lan0") == ["192.168.51.40/24"]
    assert routes("default") == ["default via 192.168.51.1 dev lan0"]


@pytest.mark.parametrize(
    "bad",
    [
        {"new_ip_address": ""},
        {"new_ip_address": "192.168.50.300"},
        {"new_ip_address": "192.168.50.30 dev eth0"},
        {"new_subnet_mask": ""},
        {"new_subnet_mask": "255.0.255.0"},
    ],
)
def test_unusable_lease_is_refused(bad):
    script("PREINIT")
    script("BOUND", status=1, **{**LEASE, **bad})
    assert addresses("lan0") == []
    assert not info_of("lan0").exists()
    assert not SOURCE.exists()


def test_what_the_server_sends_is_not_believed(tmp_path):
    mark = tmp_path / "evaluated"
    script("PREINIT")
    evil = f"x\nIPADDR=6.6.6.6\n$(touch {mark})"
    script("BOUND", **{
        **LEASE, "new_domain_name": evil, "new_dhcp_lease_time": evil, "new_network_number": "*",
        "new_broadcast_address": "-1", "new_domain_name_servers": f"nonsense 192.168.50.53 $(touch {mark})",
        "new_routers": "gw.example",
    })  # fmt: skip
    assert read_info("lan0") == {"IPADDR": "192.168.50.30", "NETMASK": "255.255.255.0", "DNS": "192.168.50.53"}
    assert "brd 192.168.50.255" in run("ip", "-4", "addr", "show", "dev", "lan0").stdout
    assert SOURCE.read_text() == "nameserver\t192.168.50.53\n"
    assert not mark.exists()


def test_router_outside_the_subnet_is_reported_and_the_address_stays():
    script("PREINIT")
    done = script("BOUND", **{**LEASE, "new_routers": "10.0.0.1"})
    assert "cannot set the default route via 10.0.0.1" in done.stderr
    assert addresses("lan0") == ["192.168.50.30/24"]


def test_old_lease_is_not_used_while_no_server_answers():
    script("TIMEOUT", status=1, **LEASE)
    assert addresses("lan0") == []


def test_bad_interface_name_is_refused():
    environment = {"PATH": os.environ["PATH"], "reason": "BOUND", **LEASE}
    for name in ("", "..", "../lan0", "a b"):
        assert run(SCRIPT, env={**environment, "interface": name}, status=1).stderr


def test_parallel_scripts_lose_no_name_server(hold):
    """The first script is held between reading the info files and writing the source, while the second works."""
    for link in LINKS:
        run("ip", "link", "set", link, "up")
    step = hold("/usr/bin/sync", "resolv4.conf")
    scripts = []
    for number, link in enumerate(LINKS, 60):
        environment = {
            **LEASE, "PATH": os.environ["PATH"], "reason": "BOUND", "interface": link, "new_routers": "",
            "new_ip_address": f"192.168.{number}.5", "new_domain_name_servers": f"192.168.{number}.53",
        }  # fmt: skip
        scripts.append(subprocess.Popen([SCRIPT], env=environment))
        wait_for(step.is_waiting, what="the first script's last step")
    wait_for(lambda: processes("flock 9") or scripts[1].poll() is not None, what="the second script's last step")
    step.release()
    assert [process.wait(120) for process in scripts] == [0, 0]
    assert set(SOURCE.read_text().split()) == {"nameserver", "192.168.60.53", "192.168.61.53"}


def test_resolver_source_without_its_lease_goes_with_the_next_stop():
    SOURCE.write_text("nameserver\t192.168.50.53\n")  # what a script that was cut short may leave
    stop("lan0")
    assert not SOURCE.exists()
