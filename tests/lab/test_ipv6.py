# box: --link eth0 --link lan0 --link lan1 --link lan2
# needs: bridge
"""How interfaces get their IPv6 addresses: every mode against a router and a DHCPv6 server on the other side."""

import contextlib
import ipaddress
import os
import pathlib
import pty
import re
import signal
import stat
import subprocess

import pytest
from conftest import (CALL_FAILED, DONE, KOVANET, NO, NOT_FOUND, OTHER_SIDE, USAGE, Daemon, complaint, data, documented,
                      kovanet, on_other_side, processes, run, wait_for)  # fmt: skip
from sdk import library, register

SCRIPTS = pathlib.Path("/etc/sysconfig/network-scripts")
CONF = pathlib.Path("/proc/sys/net/ipv6/conf")
SOURCE = pathlib.Path("/etc/iproute2/config/resolv6.conf")
RESOLV = pathlib.Path("/etc/resolv.conf")
CLIENT, LISTENER = "/usr/kova/sbin/dhclient", "/usr/kova/sbin/radnsd"
AUTO, OFF, DHCP, STATIC, AUTO_DHCP = range(5)
MODES = ["auto", "off", "dhcp", "static", "auto_dhcp"]
ROUTER, NAME_SERVER, FIXED, TAKEN = (f"2001:db8:60::{end}" for end in ("1", "53", "a5", "77"))
NETWORK = ipaddress.IPv6Network("2001:db8:60::/64")
LEASED = range(0x10, 0x21)  # last parts of what the server gives
SILENT_NAMES = ["accept_dad", "dad_transmits"]


def interface_file(name):
    return SCRIPTS / f"ifcfg-{name}"


def key_values(name="eth0"):
    return dict(line.split("=", 1) for line in interface_file(name).read_text().replace('"', "").splitlines())


def kernel_switch(switch, name="eth0"):
    return (CONF / name / switch).read_text().strip()


def pid_file(kind, name="eth0"):
    return pathlib.Path(f"/tmp/dhclient6-{name}-{kind}.pid")


def global_addresses(name="eth0"):
    """Without the prefix lengths, checked by the kernel."""
    shown = run("ip", "-6", "-o", "addr", "show", "dev", name, "scope", "global", "-tentative").stdout
    return {ipaddress.IPv6Address(found) for found in re.findall(r"inet6 ([^/]+)/", shown)}


def kinds(addresses):
    """What an address is made of: "fixed", "leased", or "own" when the interface made it of its hardware address."""
    found = set()
    for address in addresses:
        assert address in NETWORK
        end = int(address) & 0xFFFFFFFFFFFFFFFF
        found.add("fixed" if str(address) == FIXED else "leased" if end in LEASED or str(address) == TAKEN else "own")
    return found


def default_routers(name="eth0"):
    return set(re.findall(r"via (\S+)", run("ip", "-6", "route", "show", "default", "dev", name).stdout))


def link_local(side):
    """The address that eth0 gave itself, which it does a moment after its link came up."""
    shown = side("ip", "-6", "-o", "addr", "show", "dev", "eth0", "scope", "link").stdout
    return (re.search(r"inet6 ([^/]+)/", shown) or [None, None])[1]


def link_local_router():
    return link_local(on_other_side)


def clients(name="eth0"):
    """The kinds of the DHCPv6 clients that run."""
    return {kind for kind in ("client", "info") if processes(f"-pf /run/kova/dhcp-client6.{name}.{kind}.pid")}


def noted_clients(name="eth0"):
    """The kinds that the pid files name."""
    return {kind for kind in ("client", "info") if pid_file(kind, name).exists()}


class Router(Daemon):
    """dnsmasq on the other side: advertises a network, gives addresses in it, tells of a name server."""

    def __init__(self, folder, addresses="2001:db8:60::10,2001:db8:60::20,slaac"):
        self.log = folder / "router.log"
        command = [*OTHER_SIDE, "dnsmasq", "--no-daemon", "--conf-file=/dev/null", "--interface=eth0", "--bind-interfaces",
                   f"--dhcp-range={addresses},64,600", "--enable-ra", f"--dhcp-option=option6:dns-server,[{NAME_SERVER}]",
                   "--dhcp-authoritative", "--log-dhcp", "--user=root", "--group=root", "--port=0",
                   f"--log-facility={self.log}", f"--dhcp-leasefile={folder}/leases",
                   f"--pid-file={folder}/router.pid"]  # fmt: skip
        super().__init__(command, lambda: "router advertisement on" in self.text())

    def text(self):
        return self.log.read_text() if self.log.exists() else ""

    def answers(self):
        """How often it told a client something without giving it an address; a question asked again has the same number."""
        return len(set(re.findall(r"(\d+) DHCPINFORMATION-REQUEST", self.text())))


@pytest.fixture
def router(tmp_path):
    with Router(tmp_path) as daemon:
        yield daemon


def forward(on):
    on_other_side("sh", "-c", f"echo {int(on)} >/proc/sys/net/ipv6/conf/eth0/forwarding")


@pytest.fixture(autouse=True)
def wired(keep):
    keep(RESOLV).write_text("# nothing yet\n")
    keep("/etc/kovainfo.conf").write_text('dns_mode="auto"\n')
    keep(interface_file("eth0")).write_text("DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=none\n")
    on_other_side("ip", "link", "set", "eth0", "up")
    on_other_side("ip", "addr", "replace", f"{ROUTER}/64", "dev", "eth0", "nodad")
    forward(True)  # else it tells its neighbours that it is no router, and they forget their routes
    run("ip", "link", "set", "eth0", "up")
    for name in ("lan0", "lan1", "lan2"):
        run("ip", "link", "set", name, "down")
    wait_for(lambda: link_local(run) and link_local_router(), what="the link")
    yield
    for kind in ("client", "info"):
        run("/sbin/stop", "dhcp-client6", "IFACE=eth0", f"ACTION={kind}")
    run("/sbin/stop", "ra-dns")
    wait_for(lambda: not processes("/usr/kova/lib/resolver-"), what="the end of the updates in the background")
    forward(False)
    on_other_side("ip", "-6", "addr", "flush", "dev", "eth0", "scope", "global")
    for value in ("1", "0"):  # the kernel forgets what it had
        (CONF / "eth0/disable_ipv6").write_text(value)
    (CONF / "eth0/accept_ra").write_text("1")
    assert not SOURCE.exists() and not clients() and not noted_clients()


@pytest.fixture
def detection():
    """The kernel looks for duplicates on eth0, which it does not in most tests."""
    for name in SILENT_NAMES:
        (CONF / "eth0" / name).write_text("1")
    yield
    for name in SILENT_NAMES:
        (CONF / "eth0" / name).write_text("0")


def configure(mode, address=None, prefix=0, gateway=None, name="eth0"):
    texts = [text.encode() if text else None for text in (name, address, gateway)]
    return library.KOVANetIPv6ConfSet(mode, texts[0], texts[1], prefix, texts[2])


# ---- the modes ------------------------------------------------------------------------------------------------------


def tour(modes):
    """A way through all ordered pairs of different modes, each taken once, back to the first mode."""
    left = {mode: [other for other in modes if other != mode] for mode in modes}
    way, back = [modes[0]], []
    while way:
        if left[way[-1]]:
            way.append(left[way[-1]].pop())
        else:
            back.append(way.pop())
    pairs = list(zip(back, back[1:]))
    assert len(set(pairs)) == len(pairs) == len(modes) * (len(modes) - 1)
    return back


# by mode: kernel's switches, clients, addresses, whether routers are listened to
WANTED = {
    "auto": ("0", "2", set(), {"own"}, True),
    "off": ("1", None, set(), set(), False),  # routers are not asked about, whatever the switch says
    "dhcp": ("0", "2", {"client"}, {"own", "leased"}, True),
    "static": ("0", "0", set(), {"fixed"}, False),
    "auto_dhcp": ("0", "2", {"info"}, {"own"}, True),
}


def expect(read, wanted, mode):
    """Waits for a value, and shows what there is instead when it does not come."""
    with contextlib.suppress(pytest.fail.Exception):
        wait_for(lambda: read() == wanted)
    assert read() == wanted, f"in mode {mode}"


def assert_in_step(mode, accepted):
    """File, kernel, jobs, addresses, routes and name servers say the same. @return the switch for advertisements"""
    disabled, accepts, running, made_of, listens = WANTED[mode]
    accepts = accepts or accepted
    stored = key_values()
    assert (stored["IPV6INIT"], stored["IPV6_ACCEPT_RA"]) == (mode, "0" if accepts == "0" else "1")
    assert (kernel_switch("disable_ipv6"), kernel_switch("accept_ra")) == (disabled, accepts)
    expect(clients, running, mode)
    assert noted_clients() == running
    expect(lambda: bool(processes(f"{LISTENER} eth0")), listens, mode)
    expect(lambda: kinds(global_addresses()), made_of, mode)
    expect(default_routers, {link_local_router()} if listens else {ROUTER} if mode == "static" else set(), mode)
    expect(lambda: SOURCE.read_text() if SOURCE.exists() else None, f"nameserver\t{NAME_SERVER}\n" if listens else None, mode)
    return accepts


def set_mode(mode):
    kovanet("ipv6", "set", "eth0", mode, *([f"{FIXED}/64", "gateway", ROUTER] if mode == "static" else []), "--yes")


def test_every_change_between_modes_leaves_everything_in_step(router):
    before, accepted = None, None
    for mode in tour(MODES):
        set_mode(mode)
        accepted = assert_in_step(mode, accepted)
        if mode == "static" or before == "static":
            assert (key_values()["IPV6ADDR"], key_values()["IPV6PREFIXLENG"]) == (FIXED, "64")
        before = mode
    wait_for(lambda: RESOLV.read_text() == f"nameserver\t{NAME_SERVER}\n", what="/etc/resolv.conf")


def test_library_alone_sets_every_mode(router):
    """Without kovanet nobody asks the routers, but the kernel, when IPv6 comes on."""
    for mode in (AUTO_DHCP, OFF, AUTO, OFF, DHCP):
        assert configure(mode) == 0, register()
        made_of = WANTED[MODES[mode]][3]
        wait_for(lambda made_of=made_of: kinds(global_addresses()) == made_of, what=f"addresses in mode {mode}")
        assert noted_clients() == WANTED[MODES[mode]][2]
    info = pathlib.Path("/run/kova/dhcp-client6/eth0.info")
    assert f"DNS={NAME_SERVER}\n" in info.read_text()
    assert configure(STATIC, FIXED, 64) == 0, register()
    assert (kinds(global_addresses()), default_routers()) == ({"fixed"}, set())
    assert not info.exists() and not SOURCE.exists()
    on_other_side("ping", "-6", "-c", "1", "-W", "5", FIXED)


def test_static_refusals_lose_nothing(router):
    assert configure(STATIC, FIXED, 64, link_local_router()) == 0, register()
    before = (interface_file("eth0").read_text(), global_addresses(), default_routers())
    for address, prefix, result in (("fe80::5", 64, 2), (f"{FIXED}/64", 64, -1), ("ff02::5", 64, -1), ("::1", 64, -1),
                                    ("nonsense", 64, -1), (TAKEN, 129, -1)):  # fmt: skip
        assert configure(STATIC, address, prefix) == result
        assert (interface_file("eth0").read_text(), global_addresses(), default_routers()) == before


def test_static_gateway_elsewhere_is_refused_behind_the_address():
    assert configure(STATIC, FIXED, 64, "2001:db8:61::1") == 3
    assert kinds(global_addresses()) == {"fixed"} and default_routers() == set()
    assert key_values()["IPV6INIT"] == "static" and "IPV6_DEFAULTGW" not in key_values()


# ---- duplicates -----------------------------------------------------------------------------------------------------


@pytest.fixture
def taken():
    """Another machine of the network has an address, which the server does not know."""
    on_other_side("ip", "link", "add", "link", "eth0", "name", "other0", "type", "macvlan")
    on_other_side("ip", "addr", "add", f"{TAKEN}/64", "dev", "other0", "nodad")
    on_other_side("ip", "link", "set", "other0", "up")
    yield
    on_other_side("ip", "link", "del", "other0")


def test_static_duplicate_is_found_and_removed(taken, detection):
    assert configure(OFF) == 0, register()
    assert configure(STATIC, TAKEN, 64) == 1
    assert kernel_switch("disable_ipv6") == "1" and key_values()["IPV6INIT"] == "off"
    assert configure(AUTO) == 0, register()
    assert configure(STATIC, TAKEN, 64) == 1
    assert kernel_switch("disable_ipv6") == "0" and not global_addresses()
    assert key_values()["IPV6INIT"] == "auto" and "IPV6ADDR" not in key_values()


def test_leased_duplicate_is_found_and_removed(taken, detection, tmp_path):
    before = interface_file("eth0").read_text()

    def is_found():
        """A lease that comes later than the check is not seen by it."""
        interface_file("eth0").write_text(before)
        return configure(DHCP) == 1

    with Router(tmp_path, f"{TAKEN},{TAKEN}"):
        wait_for(is_found, 300, "the duplicate")
        assert not clients() and not noted_clients()
        assert ipaddress.IPv6Address(TAKEN) not in global_addresses()
        assert interface_file("eth0").read_text() == before


def test_kovanet_puts_back_what_a_duplicate_would_replace(taken, detection, router):
    set_mode("static")
    text = complaint("ipv6", "set", "eth0", "static", f"{TAKEN}/64", "--yes", status=CALL_FAILED)
    assert text == "another machine has the address that eth0 got, so nothing of it was kept; eth0 is back in mode static"
    assert kinds(global_addresses()) == {"fixed"} and default_routers() == {ROUTER}
    assert (key_values()["IPV6ADDR"], key_values()["IPV6_DEFAULTGW"]) == (FIXED, ROUTER)


# ---- the client's job -----------------------------------------------------------------------------------------------


def job(verb, kind="client", name="eth0", status=0):
    return run(f"/sbin/{verb}", "dhcp-client6", f"IFACE={name}", f"ACTION={kind}", status=status)


@pytest.mark.parametrize("name,kind,text", [("nosuch0", "client", 'no interface "nosuch0"'),
                                            ("eth0", "server", 'ACTION is client or info, not "server"')])  # fmt: skip
def test_job_refuses_what_it_cannot_do(name, kind, text):
    assert text in job("start", kind, name, status=1).stderr
    assert not clients() and not noted_clients()


def test_job_is_there_when_start_returns(router):
    for kind in ("client", "info", "client"):
        job("start", kind)
        pid = int(pid_file(kind).read_text())
        wait_for(lambda: processes(f"{CLIENT} -6"), what="the real client")
        job("start", kind)
        assert int(pid_file(kind).read_text()) == pid
        job("stop", kind)
        assert not clients() and not noted_clients()


def test_job_stays_when_all_is_told(router):
    job("start", "info")
    pid = int(pid_file("info").read_text())
    wait_for(lambda: SOURCE.exists(), what="the name server")
    wait_for(lambda: not processes(f"{CLIENT} -6"), what="the end of the real client")
    assert int(pid_file("info").read_text()) == pid and clients() == {"info"} and router.answers() == 1
    assert configure(AUTO) == 0, register()
    assert not clients() and not noted_clients() and not SOURCE.exists()


def test_job_writes_through_no_link(tmp_path, router):
    precious = tmp_path / "precious"
    precious.write_text("as it was\n")
    precious.chmod(0o600)
    pid_file("client").symlink_to(precious)
    job("start")
    assert precious.read_text() == "as it was\n" and stat.S_IMODE(precious.stat().st_mode) == 0o600
    assert not pid_file("client").is_symlink() and stat.S_IMODE(pid_file("client").stat().st_mode) == 0o644
    job("stop")
    assert precious.exists()
    pid_file("client").mkdir()
    (pid_file("client") / "inside").symlink_to(precious)
    job("start")
    assert pid_file("client").is_file()
    job("stop")
    assert precious.read_text() == "as it was\n"
    assert not list(pathlib.Path("/tmp").glob("dhclient6-*"))


def test_job_waits_for_an_address_to_ask_from_and_can_be_stopped(router):
    (CONF / "eth0/disable_ipv6").write_text("1")
    job("start")
    assert noted_clients() == {"client"} and not processes(f"{CLIENT} -6")
    assert configure(OFF) == 0, register()
    assert not clients() and not noted_clients()
    job("start")
    (CONF / "eth0/disable_ipv6").write_text("0")
    wait_for(lambda: "leased" in kinds(global_addresses()), what="the leased address")
    job("stop")
    assert "leased" not in kinds(global_addresses()) and not SOURCE.exists()


def tell(reason, status=0, **lease):
    """Runs the client's script as the client does."""
    told = {f"new_{name}": value for name, value in lease.items()}
    return run("/usr/kova/lib/dhcp-client6-script", status=status, env={"interface": "eth0", "reason": reason, **told})


def test_script_follows_the_lease():
    info = pathlib.Path("/run/kova/dhcp-client6/eth0.info")
    first, second = "2001:db8:60::11", "2001:db8:60::12"
    tell("BOUND6", ip6_address=first, ip6_prefixlen="128", dhcp6_name_servers=f"{NAME_SERVER} fe80::53 `id`")
    assert [str(address) for address in global_addresses()] == [first]
    assert info.read_text() == f"IPADDR={first}/128\nDNS={NAME_SERVER} fe80::53%eth0\n"
    assert SOURCE.read_text() == f"nameserver\t{NAME_SERVER}\nnameserver\tfe80::53%eth0\n"
    run("ip", "addr", "add", f"{FIXED}/64", "dev", "eth0")
    tell("REBIND6", ip6_address=second, ip6_prefixlen="64")
    assert {str(address) for address in global_addresses()} == {second, FIXED} and not SOURCE.exists()
    for lease in ({"ip6_address": "`id`"}, {"ip6_address": first, "ip6_prefixlen": "64 dev lo"}):
        assert "unusable lease" in tell("RENEW6", status=1, **lease).stderr
    tell("RENEW6")
    assert {str(address) for address in global_addresses()} == {FIXED} and not info.exists()
    tell("BOUND6", ip6_address=first, ip6_prefixlen="64")
    tell("EXPIRE6")
    assert {str(address) for address in global_addresses()} == {FIXED} and not info.exists()


# ---- the boot -------------------------------------------------------------------------------------------------------


def test_boot_sets_the_switches_of_all_interfaces(keep):
    files = {"eth0": ("IPV6INIT=auto\n", "2"), "lan0": ("IPV6INIT=static\n", "0"),
             "lan1": ("IPV6INIT=static\nIPV6_ACCEPT_RA=1\n", "2"), "br6": ("TYPE=bridge\nIPV6_ACCEPT_RA=0\n", "0"),
             "lan2": ("BRIDGE=br6\nIPV6INIT=auto\n", "1")}  # fmt: skip
    for name, (text, _) in files.items():
        keep(interface_file(name)).write_text(f"DEVICE={name}\nONBOOT=yes\nBOOTPROTO=none\n{text}")
        if name != "br6":
            (CONF / name / "accept_ra").write_text("1")
    try:
        assert run("/etc/rc.network", "start").stderr == ""
        assert {name: kernel_switch("accept_ra", name) for name in files} == {name: files[name][1] for name in files}
    finally:
        run("/etc/rc.network", "stop")
        for name in ("lan0", "lan1", "lan2"):
            (CONF / name / "accept_ra").write_text("1")


def test_boot_starts_the_client_of_the_mode_and_the_end_stops_it(router):
    for mode, running in (("DHCP", {"client"}), ("auto_dhcp", {"info"}), ("auto", set()), ("dhcp", {"client"})):
        interface_file("eth0").write_text(f"DEVICE=eth0\nONBOOT=yes\nBOOTPROTO=none\nIPV6INIT={mode}\n")
        run("/etc/rc.network", "start", "eth0")
        assert noted_clients() == running
        wait_for(lambda running=running: clients() == running, what=f"{running}")
    wait_for(lambda: kinds(global_addresses()) == {"own", "leased"}, what="both addresses")
    wait_for(lambda: SOURCE.exists() and SOURCE.read_text() == f"nameserver\t{NAME_SERVER}\n", what="the name server, once")
    run("/etc/rc.network", "stop", "eth0")
    assert not clients() and not noted_clients() and not SOURCE.exists() and not processes(LISTENER)
    run("ip", "link", "set", "eth0", "up")


# ---- kovanet --------------------------------------------------------------------------------------------------------


def test_show(router):
    assert data("ipv6", "show", "eth0")[0]["mode"] is None
    set_mode("static")
    [shown] = data("ipv6", "show", "eth0")
    local = [address for address in shown["addresses"] if address.startswith("fe80")]
    assert shown == {"name": "eth0", "mode": "static", "addresses": shown["addresses"], "configured_address": FIXED,
                     "configured_prefix": 64, "configured_gateway": ROUTER}  # fmt: skip
    assert sorted(shown["addresses"]) == sorted([f"{FIXED}/64", *local])
    assert list(shown) == documented("kovanet ipv6 show")
    assert [row["name"] for row in data("ipv6", "show")] == ["eth0"], "what is down has none"
    heading, line = kovanet("ipv6", "show").stdout.splitlines()
    assert heading.split() == ["NAME", "MODE", "CONFIGURED", "GATEWAY", "ADDRESSES"]
    assert line.split()[:4] == ["eth0", "static", f"{FIXED}/64", ROUTER]
    interface_file("eth0").write_text("IPV6INIT=nonsense\n")
    assert "NET_ERR_PARSE" in complaint("ipv6", "show", "eth0", status=CALL_FAILED)


@pytest.mark.parametrize("words,status,text", [
    ("set eth0 static fe80::5/64", NO, "it is link-local, and the interface gives itself such an address"),
    ("set eth0 static 2001:db8:60::5", USAGE, "static needs the address with its prefix length"),
    ("set eth0 static 2001:db8:60::5/129", NO, "is not valid"),
    ("set eth0 static ff02::5/64", NO, "it is a multicast address"),
    ("set eth0 static 2001:db8:60::5/64 gateway 2001:db8:61::1", NO,
     "it is neither in the subnet of 2001:db8:60::5/64 nor link-local (fe80::/10)"),
    ("set eth0 static 2001:db8:60::5/64 gateway fe80::1/64", NO, "it has no prefix length"),
    ("set eth0 static 2001:db8:60::5/64 gateway", USAGE, "GATEWAY"),
    ("set eth0 static", USAGE, "static needs the address"),
    ("set eth0 auto 2001:db8:60::5/64", USAGE, "auto takes no address: only static does"),
    ("set eth0 sometimes", USAGE, "sometimes"),
    ("set lan0 auto", NO, "lan0 has no IPv6 settings of its own: it is down"),
    ("set nosuch0 auto", NOT_FOUND, "nosuch0"),
    ("show lo", NO, "lo has no IPv6 settings of its own"),
])  # fmt: skip
def test_bad_words_change_nothing(words, status, text):
    before = interface_file("eth0").read_text()
    assert text in complaint("ipv6", *words.split(), *(["--yes"] if words.startswith("set") else []), status=status)
    assert interface_file("eth0").read_text() == before


def asked(*words, answer):
    """Runs a change on a terminal and answers its question; gives its status and what it says there."""
    master, slave = pty.openpty()
    with subprocess.Popen([KOVANET, "ipv6", "set", *words], stdin=slave, stdout=subprocess.PIPE, stderr=slave,
                          text=True) as process:  # fmt: skip
        os.close(slave)
        said = ""
        with contextlib.suppress(OSError):  # the terminal is gone when the command is
            while chunk := os.read(master, 4096):
                said += chunk.decode()
                if said.endswith("[y/N] "):
                    os.write(master, answer)
        os.close(master)
    return process.returncode, said.replace("\r\n", "\n")


def test_a_change_says_what_it_will_do_and_shows_that_it_takes_time():
    assert "with --yes" in complaint("ipv6", "set", "eth0", "auto", status=USAGE)
    status, said = asked("eth0", "static", f"{FIXED}/64", "gateway", ROUTER, answer=b"n\n")
    assert (status, "IPV6INIT" in key_values()) == (NO, False)
    assert said.startswith(f"eth0 loses its IPv6 addresses and gets {FIXED}/64 and the gateway {ROUTER}.\n"
                           "Connections over its IPv6 addresses end.\nContinue? [y/N] ")
    status, said = asked("eth0", "static", f"{FIXED}/64", answer=b"y\n")
    assert status == DONE and "configuring IPv6 of eth0, this takes five to ten seconds ..." in said
    status, said = asked("eth0", "dhcp", answer=b"n\n")
    assert said.startswith(f"eth0 loses its IPv6 address {FIXED}/64.\neth0 gets its IPv6 address from a DHCPv6 server.\n")
    status, said = asked("eth0", "off", answer=b"y\n")
    assert status == DONE and said.startswith("eth0 loses its IPv6 addresses and has no IPv6.\n")
    assert kernel_switch("disable_ipv6") == "1"


def test_an_interrupted_change_is_not_left_half_done(router):
    set_mode("auto")
    with subprocess.Popen([KOVANET, "ipv6", "set", "eth0", "static", f"{FIXED}/64", "--yes"]) as change:
        wait_for(lambda: "fixed" in kinds(global_addresses()), 20, "the address, while others are asked for it")
        change.send_signal(signal.SIGINT)
        assert change.wait(60) == DONE
    assert key_values()["IPV6INIT"] == "static"


def test_help_has_examples_and_exit_codes():
    for verb in ((), ("show",), ("set",), ("init",)):
        printed = kovanet("ipv6", *verb, "--help").stdout
        assert "Examples:\n  kovanet " in printed and "5 needs root" in printed
