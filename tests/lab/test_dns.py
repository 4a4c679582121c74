# box: --link eth0
"""The resolver for real: servers that are set, leased or announced, name servers on the other side that answer, the
daemons that are told, and a file that is whole whatever happens to its writer."""

import contextlib
import ctypes
import os
import pathlib
import re
import signal
import socket
import struct
import subprocess
import time

import pytest
from conftest import OTHER_SIDE, Daemon, DhcpServer, on_other_side, processes, run, wait_for
from sdk import library

RESOLV = pathlib.Path("/etc/resolv.conf")
STATIC = pathlib.Path("/etc/resolv.conf.static")
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


def wait_for_servers(*servers, limit=30):
    wait_for(lambda: RESOLV.read_text() == file_of(*servers), limit, f"/etc/resolv.conf with {servers}")


def wait_for_updates():
    wait_for(lambda: not processes(UPDATE), 30, "the end of the updates in the background")


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
    for path in (RESOLV, STATIC, OPTION, SOURCE4, SOURCE6, "/etc/kovainfo.conf", "/etc/kova/kovarelayd.conf"):
        keep(path)
    for path in (STATIC, OPTION, SOURCE4, SOURCE6):
        path.unlink(missing_ok=True)
    pathlib.Path("/etc/kovainfo.conf").write_text('dns_mode="auto"\n')
    RESOLV.write_text("# nothing yet\n")
    for address in (f"{FIRST}/24", f"{SECOND}/24", f"{IPV6}/64"):
        on_other_side("ip", "addr", "replace", address, "dev", "eth0", *(["nodad"] if ":" in address else []))
    run("ip", "addr", "flush", "dev", "eth0", "scope", "global")
    run("ip", "link", "set", "eth0", "up")
    run("ip", "addr", "add", "10.9.0.3/24", "dev", "eth0")
    wait_for(lambda: "state UP" in run("ip", "link", "show", "eth0").stdout, what="carrier")
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
        shown = run("busybox", "nslookup", "one.example").stdout
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

    wait_for(is_heard, 30, "the listener")
    advertise(advertisement(name_servers(0, sign)))
    wait_for(lambda: not SOURCE6.exists(), 30, "the end of the sign")


def announced(*servers):
    wait_for(lambda: SOURCE6.exists() and SOURCE6.read_text() == file_of(*servers), 30, f"the source with {servers}")


def test_servers_live_as_long_as_their_router_says(listening):
    advertise(advertisement(name_servers(2, "2001:db8::1"), name_servers(0xFFFFFFFF, "2001:db8::2", "2001:db8::3")))
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
        other.communicate("\n", timeout=10)


def test_client_that_stops_under_the_lock_does_not_hold_its_stopper(tmp_path):
    with leasing(tmp_path, SECOND):
        run("/sbin/start", "dhcp-client", "IFACE=eth0")
        wait_for_servers(SECOND)
        SOURCE6.write_text(file_of(IPV6))
        with configuration_lock():
            began = time.monotonic()
            run("/sbin/stop", "dhcp-client", "IFACE=eth0")
            assert time.monotonic() - began < 4, "it waited for the lock, which is given up after 5 seconds"
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
    wait_for(lambda: ANSWERS[FIRST] in relayed(), 30, "an answer of the server that is there")
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


def test_pppoe_relay_job_can_be_stopped_and_needs_its_settings():
    run("/sbin/stop", "pppoerelay")
    assert "does not say enable=yes" in run("/sbin/start", "pppoerelay", "IFACE=eth0", status=1).stderr
    assert library.KLIBServicectlJobStop(b"pppoerelay") == 0


# ---- a file that is whole ------------------------------------------------------------------------------------------

OLD = file_of(*(f"10.1.0.{number}" for number in range(1, 251)))
NEW = file_of(*(f"10.2.0.{number}" for number in range(1, 251)))  # more than one write takes

READING = """
import sys
whole = {open(path).read() for path in sys.argv[1:3]}
reads = 0
seen = set()
print("reads", flush=True)
while True:
    try:
        text = open("/etc/resolv.conf").read()
    except FileNotFoundError:
        text = "missing"
    if text not in whole:
        sys.exit(f"torn after {reads} reads: {text[:80]!r}, {len(text)} characters")
    reads += 1
    seen.add(text)
    if reads % 500 == 0:
        print(reads, len(seen), flush=True)
"""


@contextlib.contextmanager
def reader(folder):
    """A program that reads the file again and again and ends when it is missing or torn; gives a call that tells how
    often it has read, and how many of the two contents it has seen."""
    (folder / "old").write_text(OLD)
    (folder / "new").write_text(NEW)
    RESOLV.write_text(OLD)
    log = folder / "reads"
    with log.open("w") as out, subprocess.Popen(["/usr/bin/python3", "-c", READING, folder / "old", folder / "new"],
                                                stdout=out, stderr=subprocess.STDOUT) as process:  # fmt: skip
        wait_for(log.read_text, what="the reader")

        def progress():
            assert process.poll() is None, log.read_text()
            line = log.read_text().splitlines()[-1].split()
            return (int(line[0]), int(line[1])) if line[0] != "reads" else (0, 0)

        yield progress
        process.terminate()


def test_reader_never_sees_a_torn_file_while_many_write(tmp_path):
    OPTION.unlink(missing_ok=True)
    program = ("import sys; sys.path.insert(0, sys.argv[1]); from sdk import library, core; import ctypes\n"
               "core.KLIBCSzListAlloc.restype = ctypes.c_void_p\n"
               "for turn in range(50):\n"
               "    servers = ctypes.c_void_p(core.KLIBCSzListAlloc(512))\n"
               "    for number in range(1, 251):\n"
               "        core.KLIBCSzListPush(ctypes.byref(servers), b'10.%d.0.%d' % (1 + turn % 2, number))\n"
               "    assert library.KOVANetDNSFileSet(servers, None) == 0\n")
    with reader(tmp_path) as progress:
        writers = [subprocess.Popen(["/usr/bin/python3", "-B", "-c", program, pathlib.Path(__file__).parent])
                   for _ in range(4)]
        assert [writer.wait(120) for writer in writers] == [0] * 4
        wait_for(lambda: progress()[0] >= 500 and progress()[1] == 2, 60, "reads of both contents")
    assert sorted(path.name for path in RESOLV.parent.glob("resolv.conf*")) == ["resolv.conf"]


PTRACE_TRACEME, PTRACE_KILL, PTRACE_SYSCALL, PTRACE_SETOPTIONS = 0, 8, 24, 0x4200
PTRACE_O_EXITKILL, PTRACE_O_TRACESYSGOOD = 0x100000, 1
libc = ctypes.CDLL(None, use_errno=True)


def kill_at_stop(call, number):
    """Runs a call in a child and kills the child at a stop: each system call stops twice, before and after. Gives
    whether there were that many."""
    child = os.fork()
    if child == 0:
        libc.ptrace(PTRACE_TRACEME, 0, None, None)
        os.kill(os.getpid(), signal.SIGSTOP)
        call()
        os._exit(0)
    _, status = os.waitpid(child, 0)
    assert os.WIFSTOPPED(status)
    libc.ptrace(PTRACE_SETOPTIONS, child, None, PTRACE_O_EXITKILL | PTRACE_O_TRACESYSGOOD)
    stops, pending = 0, 0
    while stops < number:
        assert libc.ptrace(PTRACE_SYSCALL, child, None, pending) == 0
        _, status = os.waitpid(child, 0)
        if os.WIFEXITED(status):
            assert os.WEXITSTATUS(status) == 0
            return False
        is_call = os.WSTOPSIG(status) == signal.SIGTRAP | 0x80
        stops += is_call
        pending = 0 if is_call else os.WSTOPSIG(status)
    os.kill(child, signal.SIGKILL)
    os.waitpid(child, 0)
    return True


def test_writer_killed_at_every_step_leaves_a_whole_file(tmp_path):
    contents = {"old": OLD, "new": NEW}
    outcomes, stops = [], 0
    with reader(tmp_path) as progress:
        went_on = True
        while went_on:
            stops += 1
            RESOLV.with_name("resolv.conf.fresh").write_text(OLD)
            RESOLV.with_name("resolv.conf.fresh").rename(RESOLV)
            SOURCE4.write_text(NEW)
            went_on = kill_at_stop(library.KOVANetDNSUpdate, stops)
            outcomes += [name for name, content in contents.items() if RESOLV.read_text() == content]
            assert len(outcomes) == stops, f"neither file after stop {stops}"
        wait_for(lambda: progress()[0] >= 500 and progress()[1] == 2, 60, "reads of both contents")
    # the new file from one step on, and only from there: the rename
    assert outcomes == sorted(outcomes, reverse=True) and {"old", "new"} == set(outcomes)
    assert outcomes.count("old") > 40
    for litter in RESOLV.parent.glob("resolv.conf.*"):
        assert re.fullmatch(r"resolv\.conf\.\w{6}", litter.name)
        litter.unlink()
    assert library.KOVANetDNSUpdate() == 0, "no dead writer keeps the lock"
