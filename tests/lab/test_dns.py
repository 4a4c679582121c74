# box: --link eth0
"""The resolver for real: servers that are set, leased or announced, name servers on the other side that answer, the
daemons that are told, and a file that is whole whatever happens to its writer."""

import contextlib
import ctypes
import os
import pathlib
import re
import socket
import struct
import subprocess
import time

import pytest
from conftest import OTHER_SIDE, Daemon, DhcpServer, on_other_side, processes, run, wait_for
from sdk import library
from steps import Watch, killed_at_each_step

RESOLV = pathlib.Path("/etc/resolv.conf")
STATIC = pathlib.Path("/etc/resolv.conf.static")
INFO = pathlib.Path("/etc/kovainfo.conf")
OPTION = pathlib.Path("/etc/resolv.conf.option")
SOURCE4 = pathlib.Path("/etc/iproute2/config/resolv4.conf")
SOURCE6 = pathlib.Path("/etc/iproute2/config/resolv6.conf")
UPDATE = "/usr/kova/lib/resolver-update"
FIRST, SECOND, IPV6 = "10.9.0.1", "10.9.0.2", "2001:db8:9::1"
ANSWERS = {FIRST: "203.0.113.1", SECOND: "203.0.113.2", IPV6: "203.0.113.6"}


def kovanet(*words, **options):
    return run("/usr/bin/kovanet", "dns", *words, **options)


def file_of(*servers):
    return "".join(f"nameserver\t{server}\n" for server in servers)


def wait_for_servers(*servers):
    wait_for(lambda: RESOLV.read_text() == file_of(*servers), what=f"/etc/resolv.conf with {servers}")


def wait_for_updates():
    """Also for those that are just being started, by resolver-source."""
    wait_for(lambda: not processes("/usr/kova/lib/resolver-"), what="the end of the updates in the background")


class NameServer(Daemon):
    """dnsmasq on the other side: answers for one.example with an address that tells which server it is."""

    def __init__(self, folder, address):
        self.log = folder / f"names.{address.replace(':', '_')}.log"
        command = [*OTHER_SIDE, "dnsmasq", "--no-daemon", "--conf-file=/dev/null", "--no-resolv", "--no-hosts",
                   f"--listen-address={address}", "--bind-interfaces", "--local=/example/",
                   f"--address=/one.example/{ANSWERS[address]}", "--user=root", "--group=root", "--log-queries",
                   f"--log-facility={self.log}", f"--pid-file={self.log}.pid"]  # fmt: skip
        super().__init__(command, lambda: "started, version" in self.text())

    def text(self):
        return self.log.read_text() if self.log.exists() else ""


def leasing(folder, server, *more):
    """A DHCP server that names a name server."""
    return DhcpServer("eth0", "10.9.0", f"--dhcp-option=option:dns-server,{server}", "--dhcp-option=option:router",
                      *more, folder=folder)  # fmt: skip


@pytest.fixture(autouse=True)
def appliance(keep):
    for path in (RESOLV, STATIC, OPTION, SOURCE4, SOURCE6, INFO, "/etc/kova/kovarelayd.conf"):
        keep(path)
    for path in (STATIC, OPTION, SOURCE4, SOURCE6):
        path.unlink(missing_ok=True)
    INFO.write_text('dns_mode="auto"\n')
    RESOLV.write_text("# nothing yet\n")
    for address in (f"{FIRST}/24", f"{SECOND}/24", f"{IPV6}/64"):
        on_other_side("ip", "addr", "replace", address, "dev", "eth0", *(["nodad"] if ":" in address else []))
    run("ip", "addr", "flush", "dev", "eth0", "scope", "global")
    run("ip", "link", "set", "eth0", "up")
    run("ip", "addr", "add", "10.9.0.3/24", "dev", "eth0")
    for side in (run, on_other_side):
        wait_for(lambda side=side: "state UP" in side("ip", "link", "show", "eth0").stdout, what="carrier")
    yield
    for job in ("dhcp-client", "ra-dns", "kovarelayd", "ddns"):
        run("/sbin/stop", job)
    wait_for_updates()


@pytest.fixture
def two_servers(tmp_path):
    with NameServer(tmp_path, FIRST), NameServer(tmp_path, SECOND):
        yield


def resolved(name="one.example", status=0):
    """The address that the C library's resolver finds, through the files as they are now."""
    return run("getent", "ahostsv4", name, status=status).stdout.split(" ")[0]


# ---- servers that are set ------------------------------------------------------------------------------------------


def test_servers_just_set_answer(two_servers):
    for server in (FIRST, SECOND, FIRST):
        kovanet("set", server)
        assert RESOLV.read_text() == STATIC.read_text() == file_of(server)
        assert resolved() == ANSWERS[server]
        shown = run("busybox", "nslookup", "-type=a", "one.example").stdout
        assert re.search(rf"Server:\s+{re.escape(server)}\b", shown) and ANSWERS[server] in shown


def test_server_that_is_not_there_is_passed_over(two_servers):
    kovanet("set", "10.9.0.77", SECOND)
    assert resolved() == ANSWERS[SECOND]


def test_search_domain_of_the_option_file_is_used(two_servers):
    kovanet("set", FIRST)
    assert resolved("one", status=None) == ""
    OPTION.write_text("# for people\ndomain\texample\n")
    kovanet("update")
    assert RESOLV.read_text() == file_of(FIRST) + "domain\texample\n"
    assert resolved("one") == ANSWERS[FIRST]


def test_first_server_is_told_to_c_programs():
    kovanet("set", FIRST, SECOND)
    buffer = ctypes.create_string_buffer(b"x" * 15, 16)
    assert library.KOVANetDNSGet(buffer, 4) == 0 and buffer.raw[:5] == b"10.\0x"
    assert library.KOVANetDNSGet(buffer, 16) == 0 and buffer.value == FIRST.encode()


# ---- servers that the network tells --------------------------------------------------------------------------------


def test_leased_server_is_used_in_mode_auto_and_back(two_servers, tmp_path):
    kovanet("set", FIRST)
    with leasing(tmp_path, SECOND):
        run("/sbin/start", "dhcp-client", "IFACE=eth0")
        wait_for(SOURCE4.exists, what="the lease's servers")
        wait_for_updates()
        assert SOURCE4.read_text() == file_of(SECOND)
        assert RESOLV.read_text() == file_of(FIRST) and resolved() == ANSWERS[FIRST]
        kovanet("mode", "auto")
        assert RESOLV.read_text() == file_of(SECOND) and resolved() == ANSWERS[SECOND]
        kovanet("mode", "static")
        assert RESOLV.read_text() == file_of(FIRST) and resolved() == ANSWERS[FIRST]


def test_lease_is_used_without_being_asked(two_servers, tmp_path):
    with leasing(tmp_path, SECOND):
        run("/sbin/start", "dhcp-client", "IFACE=eth0")
        wait_for_servers(SECOND)
        assert resolved() == ANSWERS[SECOND]
    run("/sbin/stop", "dhcp-client")
    assert not SOURCE4.exists()
    wait_for_updates()
    assert RESOLV.read_text() == file_of(SECOND), "without a server the file stays"


def test_announced_ipv6_server_is_used(tmp_path):
    announcing = ["--enable-ra", "--dhcp-range=2001:db8:9::,ra-only,64", f"--dhcp-option=option6:dns-server,[{IPV6}]"]
    with NameServer(tmp_path, IPV6), leasing(tmp_path, FIRST, *announcing) as server:
        run("/sbin/start", "ra-dns", "IFACE=eth0")
        wait_for_servers(IPV6)
        assert "RTR-SOLICIT(eth0)" in server.text() and "RTR-ADVERT(eth0)" in server.text()
        wait_for(lambda: "2001:db8:9:" in run("ip", "-6", "addr", "show", "dev", "eth0", "-tentative").stdout,
                 what="an address from the router")
        assert resolved() == ANSWERS[IPV6]
        run("/sbin/start", "dhcp-client", "IFACE=eth0")
        wait_for_servers(FIRST, IPV6)
    run("/sbin/stop", "ra-dns")
    assert not SOURCE6.exists()
    wait_for_servers(FIRST)


def test_boot_listens_where_routers_configure_ipv6(keep):
    file = keep("/etc/sysconfig/network-scripts/ifcfg-eth0")
    for mode, listens in (("auto", True), ("auto_dhcp", True), ("static", False), ("auto", True), ("off", False)):
        file.write_text(f"DEVICE=eth0\nBOOTPROTO=none\nONBOOT=yes\nIPV6INIT={mode}\n")
        run("/etc/rc.network", "start", "eth0")
        assert bool(processes("/usr/kova/sbin/radnsd eth0")) == listens, mode
    file.write_text("DEVICE=eth0\nBOOTPROTO=none\nONBOOT=yes\nIPV6INIT=auto\n")
    run("/etc/rc.network", "start", "eth0")
    run("/etc/rc.network", "stop", "eth0")
    assert not processes("/usr/kova/sbin/radnsd")


# ---- what routers say, byte by byte ---------------------------------------------------------------------------------

ADVERTISING = """
import socket, sys
raw = socket.socket(socket.AF_INET6, socket.SOCK_RAW, socket.IPPROTO_ICMPV6)
raw.setsockopt(socket.IPPROTO_IPV6, socket.IPV6_MULTICAST_HOPS, int(sys.argv[1]))
raw.setsockopt(socket.IPPROTO_IPV6, socket.IPV6_MULTICAST_IF, socket.if_nametoindex("eth0"))
if sys.argv[2]:
    raw.bind((sys.argv[2], 0))
raw.sendto(bytes.fromhex(sys.argv[3]), ("ff02::1", 0, 0, socket.if_nametoindex("eth0")))
"""


def advertisement(*options, code=0):
    return struct.pack("!BBHBBHII", 134, code, 0, 64, 0, 0, 0, 0) + b"".join(options)


def name_servers(lifetime, *addresses):
    packed = b"".join(socket.inet_pton(socket.AF_INET6, address) for address in addresses)
    return struct.pack("!BBHI", 25, 1 + 2 * len(addresses), 0, lifetime) + packed


def advertise(message, hops=255, source=""):
    on_other_side("/usr/bin/python3", "-c", ADVERTISING, hops, source, message.hex())


@pytest.fixture
def listening():
    run("/sbin/start", "ra-dns", "IFACE=eth0")
    # an announced server tells that it hears; then it is taken back
    sign = "2001:db8:9::ffff"

    def is_heard():
        advertise(advertisement(name_servers(600, sign)))
        return SOURCE6.exists()

    wait_for(is_heard, what="the listener")
    advertise(advertisement(name_servers(0, sign)))
    wait_for(lambda: not SOURCE6.exists(), what="the end of the sign")


def announced(*servers):
    wait_for(lambda: SOURCE6.exists() and SOURCE6.read_text() == file_of(*servers), what=f"the source with {servers}")


def test_servers_live_as_long_as_their_router_says(listening):
    advertise(advertisement(name_servers(15, "2001:db8::1"), name_servers(0xFFFFFFFF, "2001:db8::2", "2001:db8::3")))
    announced("2001:db8::1", "2001:db8::2", "2001:db8::3")
    wait_for_servers("2001:db8::1", "2001:db8::2", "2001:db8::3")
    announced("2001:db8::2", "2001:db8::3")
    advertise(advertisement(name_servers(0, "2001:db8::2")))
    announced("2001:db8::3")
    wait_for_servers("2001:db8::3")


def test_server_of_the_link_is_written_with_its_interface(listening):
    advertise(advertisement(name_servers(600, "fe80::53")))
    announced("fe80::53%eth0")


GOOD = name_servers(600, "2001:db8::bad")
UNUSABLE = {
    "another code": (advertisement(GOOD, code=1), {}),
    "forwarded": (advertisement(GOOD), {"hops": 64}),
    "not of the link": (advertisement(GOOD), {"source": IPV6}),
    "empty option before": (advertisement(b"\x01\x00" + bytes(6), GOOD), {}),
    "empty option behind": (advertisement(GOOD, b"\x01\x00" + bytes(6)), {}),
    "option cut short": (advertisement(GOOD[:-8]), {}),
    "one byte too many": (advertisement(GOOD, b"\x19"), {}),
    "head cut short": (advertisement()[:12], {}),
    "no address": (advertisement(struct.pack("!BBHI", 25, 1, 0, 600)), {}),
    "half an address": (advertisement(struct.pack("!BBHI", 25, 2, 0, 600) + bytes(8)), {}),
    "no host's address": (advertisement(name_servers(600, "::", "::1", "ff02::1")), {}),
}


@pytest.mark.parametrize("case", UNUSABLE)
def test_what_is_no_advertisement_changes_nothing(listening, case):
    message, how = UNUSABLE[case]
    advertise(message, **how)
    advertise(advertisement(name_servers(600, "2001:db8::900d")))  # comes after it
    announced("2001:db8::900d")


def test_number_of_servers_is_limited(listening):
    many = [f"2001:db8::{number:x}" for number in range(1, 100)]
    advertise(advertisement(name_servers(600, *many)))
    announced(*many[:8])


def test_interface_that_is_not_there_is_refused():
    assert 'no interface "nosuch0"' in run("/sbin/start", "ra-dns", "IFACE=nosuch0", status=1).stderr
    assert run("/usr/kova/sbin/radnsd", status=2).stderr.startswith("usage: radnsd ")
    assert "cannot listen" in run("/usr/kova/sbin/radnsd", "nosuch0", "/bin/true", status=1).stderr
    assert run("/usr/kova/lib/resolver-source", "5", status=2).stderr.startswith("usage: resolver-source ")


# ---- locks ----------------------------------------------------------------------------------------------------------


@contextlib.contextmanager
def configuration_lock():
    """Another program that is changing the network."""
    program = "import ctypes; print(ctypes.CDLL('libkovacore.so.6').KLIBCFileLock(0x106, 5), flush=True); input()"
    command = ["/usr/bin/python3", "-c", program]
    with subprocess.Popen(command, stdin=subprocess.PIPE, stdout=subprocess.PIPE, text=True) as other:
        assert other.stdout.readline() == "0\n"
        yield
        other.communicate("\n", timeout=60)


def test_client_that_stops_under_the_lock_does_not_hold_its_stopper(tmp_path):
    with leasing(tmp_path, SECOND):
        run("/sbin/start", "dhcp-client", "IFACE=eth0")
        wait_for_servers(SECOND)
        SOURCE6.write_text(file_of(IPV6))
        with configuration_lock():
            run("/sbin/stop", "dhcp-client", "IFACE=eth0")
            # it did not wait for the lock: the update still does, twelve times 5 seconds
            wait_for(lambda: processes(UPDATE), what="the update in the background")
            time.sleep(6)  # longer than one attempt waits
            assert RESOLV.read_text() == file_of(SECOND)
        wait_for_servers(IPV6)


# ---- the daemons that are told --------------------------------------------------------------------------------------


def test_daemons_log_their_reload(system_log):
    run("/sbin/start", "ddns")
    run("/sbin/start", "kovarelayd")
    for name in ("ddns", "kovarelayd"):
        wait_for(lambda name=name: run(f"/usr/kova/service/{name}", "status", status=None).returncode == 0, what=name)
    wait_for(lambda: system_log.holds("name servers:"), what="the relay's first reading")
    assert not system_log.holds("reload")
    kovanet("set", FIRST, SECOND)
    for name in ("ddnsd", "kovarelayd"):
        wait_for(lambda name=name: any(re.search(rf"{name}\S*: reload$", text.strip("\0\n"))
                                       for text in system_log.messages), what=f"{name}'s line")  # fmt: skip
    wait_for(lambda: system_log.holds(f"name servers: {FIRST} {SECOND}"), what="the relay's new servers")


def test_relay_that_does_not_run_is_not_reloaded(system_log):
    assert run("/usr/kova/service/kovarelayd", "status", status=None).returncode == 1
    kovanet("set", FIRST)
    run("/usr/kova/service/kovarelayd", "reload")
    assert not system_log.holds("kovarelayd")


def test_relay_asks_the_servers_in_use(two_servers):
    def relayed():
        return run("busybox", "nslookup", "one.example", "127.0.0.1", status=None).stdout

    kovanet("set", FIRST)
    run("/sbin/start", "kovarelayd")
    wait_for(lambda: ANSWERS[FIRST] in relayed(), what="an answer of the first server")
    kovanet("set", SECOND)
    wait_for(lambda: ANSWERS[SECOND] in relayed(), what="an answer of the second server")
    kovanet("set", "10.9.0.77", FIRST)  # the first of them is silent
    wait_for(lambda: ANSWERS[FIRST] in relayed(), what="an answer of the server that is there")
    run("/sbin/stop", "kovarelayd")
    assert not processes("/usr/kova/sbin/kovarelayd") and not pathlib.Path("/run/kova/kovarelayd.pid").exists()


def test_relay_outlives_what_is_no_question(two_servers):
    kovanet("set", FIRST)
    run("/sbin/start", "kovarelayd")
    wait_for(lambda: run("/usr/kova/service/kovarelayd", "status", status=None).returncode == 0, what="the relay")
    with socket.socket(socket.AF_INET, socket.SOCK_DGRAM) as client:
        for message in (b"", b"x", bytes(11), b"\0\0\x80" + bytes(9), os.urandom(60000)):
            client.sendto(message, ("127.0.0.1", 53))
    wait_for(lambda: ANSWERS[FIRST] in run("busybox", "nslookup", "one.example", "127.0.0.1", status=None).stdout)


@pytest.mark.parametrize("text", ["127.0.0.1", "host:53", "127.0.0.1:0", "127.0.0.1:65536", "127.0.0.1:53x", ":53"])
def test_relay_refuses_an_unusable_address(text):
    pathlib.Path("/etc/kova/kovarelayd.conf").write_text(f"listen={text}\n")
    assert "cannot relay" in run("/usr/kova/sbin/kovarelayd", status=1).stderr


def test_pppoe_relay_job_can_be_stopped(keep):
    relay, settings = keep("/usr/sbin/pppoe-relay"), keep("/etc/sysconfig/pppoe-relay/eth0")
    settings.parent.mkdir(parents=True, exist_ok=True)
    assert "does not say enable=yes" in run("/sbin/start", "pppoerelay", "IFACE=eth0", status=1).stderr
    settings.write_text("enable=yes\nserver=eth1\n")
    relay.write_text("#!/bin/sh\nwhile sleep 0.1; do :; done\n")
    relay.chmod(0o755)
    run("/sbin/start", "pppoerelay", "IFACE=eth0")
    wait_for(lambda: processes(f"{relay} -C eth0 -S eth1"), what="the relay")
    assert library.KLIBServicectlJobStop(b"pppoerelay") == 0
    assert not processes(str(relay))
    assert library.KLIBServicectlJobStop(b"pppoerelay") == 0


# ---- a file that is whole ------------------------------------------------------------------------------------------

OLD = file_of(*(f"10.1.0.{number}" for number in range(1, 251)))
NEW = file_of(*(f"10.2.0.{number}" for number in range(1, 251)))  # more than one write takes

WRITING = """
import ctypes, sys
sys.path.insert(0, sys.argv[1])
from sdk import core, library
core.KLIBCSzListAlloc.restype = ctypes.c_void_p
for turn in range(50):
    servers = ctypes.c_void_p(core.KLIBCSzListAlloc(512))
    for number in range(1, 251):
        core.KLIBCSzListPush(ctypes.byref(servers), b"10.%d.0.%d" % (1 + turn % 2, number))
    assert library.KOVANetDNSFileSet(servers, None) == 0
"""


def litter(target):
    """The temporary files that a killed writer has left beside its target."""
    return [path for path in target.parent.iterdir() if re.fullmatch(rf"{re.escape(target.name)}\.\w{{6}}", path.name)]


def replace(target, text):
    fresh = target.with_name("fresh")
    fresh.write_text(text)
    fresh.rename(target)


def test_reader_never_sees_a_torn_file_while_many_write():
    RESOLV.write_text(OLD)
    with Watch(RESOLV) as watch:
        wait_for(lambda: watch.reads, what="the first read")
        writers = [subprocess.Popen(["/usr/bin/python3", "-B", "-c", WRITING, pathlib.Path(__file__).parent])
                   for _ in range(4)]
        assert [writer.wait(120) for writer in writers] == [0] * 4
        reads = watch.reads
        wait_for(lambda: watch.reads > reads + 1, what="a read of the last content")
    assert reads > 100 and watch.contents == {OLD, NEW}
    assert not litter(RESOLV)


def test_writer_killed_at_every_step_leaves_a_whole_file():
    SOURCE4.write_text(NEW)
    RESOLV.write_text(OLD)

    def prepare():
        replace(RESOLV, OLD)
        return "/usr/bin/kovanet", "dns", "update"

    with Watch(RESOLV) as watch:
        left = [RESOLV.read_text() for _ in killed_at_each_step(prepare)]
        assert RESOLV.read_text() == NEW, "it got through in the end"
    assert watch.contents == {OLD, NEW} and watch.reads > len(left)
    # the new file from the rename on, with steps before and after it; one run may take a few calls more than another
    first_new, last_old = left.index(NEW), len(left) - 1 - left[::-1].index(OLD)
    assert first_new > 10 and last_old - first_new < 10 and set(left) == {OLD, NEW}
    assert litter(RESOLV), "none was killed between the making of the file and its rename"
    for path in litter(RESOLV):
        path.unlink()
    assert library.KOVANetDNSUpdate() == 0, "no dead writer keeps the lock"


def test_setter_killed_at_every_step_leaves_whole_files():
    servers = [line.split()[1] for line in NEW.splitlines()]
    auto, static = 'dns_mode="auto"\n', 'dns_mode="static"\n'
    before = {STATIC: OLD, RESOLV: OLD, INFO: auto}

    def prepare():
        for path, text in before.items():
            replace(path, text)
        return "/usr/bin/kovanet", "dns", "set", *servers

    left = {tuple(path.read_text() for path in before) for _ in killed_at_each_step(prepare)}
    # one file after the other, each whole: the list, the mode, what is in use
    assert left == {(OLD, OLD, auto), (NEW, OLD, auto), (NEW, OLD, static), (NEW, NEW, static)}
    for path in litter(STATIC) + litter(RESOLV):
        path.unlink()
    assert kovanet("show").stdout.startswith("mode:       static\n")
